#!/bin/sh
# SPDX-License-Identifier: MIT
#
# Makes tests/fixtures/examine: what mdadm's examine command reports, one file a quirk, taken from
# real superblocks inside the virtual appliance. NAME.txt is its standard output, NAME.err its
# standard error where it wrote any. UUIDs are set, so that the tests can name them; device UUIDs
# and times differ from run to run.
set -u

REPORTS=/tmp/examine
MEMBERS='/dev/sda3 /dev/sdb3 /dev/sdc3 /dev/sdd3'

# --- outside -----------------------------------------------------------------------------------

make_outside() {
    here=$(cd "$(dirname "$0")" && pwd)
    target=$here/../fixtures/examine
    archive=$(mktemp) || exit 1
    trap 'rm -f "$archive"' EXIT
    "$here/../../appliance/run" --build none --disks 4 --size 128M \
        --file "$here/lib.sh:/appliance/lib.sh" "$here/${0##*/}" inside >"$archive" || {
        cat "$archive" >&2
        exit 1
    }
    mkdir -p "$target"
    rm -f "$target"/*.txt "$target"/*.err
    tar -x -f "$archive" -C "$target"
}

if [ "${1:-}" != inside ]; then
    make_outside
    exit
fi

# --- inside ------------------------------------------------------------------------------------

# shellcheck source=SCRIPTDIR/lib.sh
. /appliance/lib.sh

# examine NAME DEVICE
examine() {
    mdadm -E "$2" >"$REPORTS/$1.txt" 2>"$REPORTS/$1.err"
    [ -s "$REPORTS/$1.err" ] || rm "$REPORTS/$1.err"
}

# array MD ARGUMENT...: a new array of that number, at rest.
array() {
    number=$1
    shift
    make_array "$number" --uuid="$(uuid "$number")" --assume-clean "$@"
    must mdadm --wait-clean "/dev/md$number"
}

# What is left of the last arrays must not show in the next report.
blank() {
    for node in /dev/md[0-9]*; do
        [ ! -b "$node" ] || mdadm -S "$node" >/dev/null 2>&1
    done
    for member in $MEMBERS; do
        must wipefs -q -a "$member"
    done
}

# keep NAME MEMBER MD ARGUMENT...: makes an array, examines a member of it, takes it down.
keep() {
    name=$1
    member=$2
    shift 2
    array "$@"
    examine "$name" "$member"
    blank
}

mkdir "$REPORTS"
partition_disks '16M 16M' sda sdb sdc sdd
blank
for format in 0.90 1.0 1.1 1.2; do
    keep "mirror-$format" /dev/sdb3 2 -e "$format" -l 1 -n 2 /dev/sda3 /dev/sdb3
    keep "spare-$format" /dev/sdc3 3 -e "$format" -l 1 -n 2 -x 1 /dev/sda3 /dev/sdb3 /dev/sdc3
done

keep level-raid0 /dev/sda3 4 -l 0 -n 2 /dev/sda3 /dev/sdb3
keep level-raid4 /dev/sda3 5 -l 4 -n 3 /dev/sda3 /dev/sdb3 /dev/sdc3
keep level-raid5 /dev/sdc3 6 -l 5 -n 3 /dev/sda3 /dev/sdb3 /dev/sdc3
# shellcheck disable=SC2086  # a list of words
keep level-raid6 /dev/sdd3 7 -l 6 -n 4 $MEMBERS
# shellcheck disable=SC2086
keep level-raid10 /dev/sda3 8 -l 10 -n 4 $MEMBERS
keep level-linear /dev/sdb3 9 -l linear -n 2 /dev/sda3 /dev/sdb3
keep level-linear-0.90 /dev/sdb3 9 -e 0.90 -l linear -n 2 /dev/sda3 /dev/sdb3

keep name-of-another-host /dev/sda3 12 --homehost=attic -l 1 -n 2 /dev/sda3 /dev/sdb3
keep name-without-number /dev/sda3 13 --name=data -l 1 -n 2 /dev/sda3 /dev/sdb3
# Too long to fit in front of the name, so it is left out.
keep name-without-host /dev/sda3 14 --homehost=a-host-of-thirty-characters-00 -l 1 -n 2 \
    /dev/sda3 /dev/sdb3
keep name-with-umlaut /dev/sda3 15 --name='größe' -l 1 -n 2 /dev/sda3 /dev/sdb3
keep name-with-two-colons /dev/sda3 16 --name='a:b:16' -l 1 -n 2 /dev/sda3 /dev/sdb3
keep preferred-minor-127 /dev/sda3 127 -e 0.90 -l 1 -n 2 /dev/sda3 /dev/sdb3

array 20 -l 5 -n 3 /dev/sda3 /dev/sdb3 /dev/sdc3
fail_member 20 sdb3
examine degraded-raid5 /dev/sdc3
examine failed-member /dev/sdb3
blank

array 21 -e 0.90 -l 5 -n 3 /dev/sda3 /dev/sdb3 /dev/sdc3
fail_member 21 sdb3
examine degraded-raid5-0.90 /dev/sdc3
blank

# The stop breaks the copy off and tells the replacement's superblock what it is.
array 22 -l 1 -n 2 -x 1 /dev/sda3 /dev/sdb3 /dev/sdc3
slow_resync
must mdadm /dev/md22 --replace /dev/sda3 --with /dev/sdc3
await grep -q recover /sys/block/md22/md/sync_action
must mdadm --stop /dev/md22
examine role-replacement /dev/sdc3
fast_resync
blank

keep role-journal /dev/sdd3 23 -l 5 -n 3 --write-journal /dev/sdd3 \
    /dev/sda3 /dev/sdb3 /dev/sdc3
keep bitmap-internal /dev/sda3 24 -l 1 -n 2 --bitmap=internal /dev/sda3 /dev/sdb3

examine no-superblock /dev/sda3
examine no-such-device /dev/sdz3
examine mbr-only /dev/sda
echo 'LAUFWERKE /dev/sd*' >/etc/mdadm/mdadm.conf
keep warning-on-standard-error /dev/sda3 40 -l 1 -n 2 /dev/sda3 /dev/sdb3
rm /etc/mdadm/mdadm.conf
must sh -c 'echo "label: gpt" | sfdisk.stock -q --wipe always /dev/sdd'
examine gpt-only /dev/sdd

# Containers want whole disks, so the tables go last.
must mdadm --create /dev/md30 --run -e ddf -l container -n 2 /dev/sda /dev/sdb
examine container-ddf /dev/sda
must mdadm --stop /dev/md30
must wipefs -q -a /dev/sda /dev/sdb
IMSM_NO_PLATFORM=1 must mdadm --create /dev/md31 --run -e imsm -l container -n 2 /dev/sdc /dev/sdd
IMSM_NO_PLATFORM=1 examine container-imsm /dev/sdc
must mdadm --stop /dev/md31

tar -c -f - -C "$REPORTS" .
