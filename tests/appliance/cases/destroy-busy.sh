#!/bin/sh
# SPDX-License-Identifier: MIT
# Arrays that are in use stay as they are, and arrays that are not there are not found.
# disks: 4
# size: 64M
# shellcheck source=SCRIPTDIR/../lib.sh
. /appliance/lib.sh
plan 8

# The superblock area of a 1.2 array.
superblocks() {
    for node in "$@"; do
        blockdev --flushbufs "/dev/$node"
        echo "$node $(head -c 8192 "/dev/$node" | md5sum)"
    done
}

# make_file_system NODE FOLDER: mounted, with a file, and with nothing left to be written later.
make_file_system() {
    must mkfs.ext4 -q -E lazy_itable_init=0,lazy_journal_init=0 "$1"
    must mkdir "$2"
    must mount "$1" "$2"
    pattern "$2" >"$2/file"
    sync
}

file_is_whole() {
    echo 3 >/proc/sys/vm/drop_caches
    [ "$(md5sum <"$1/file")" = "$(pattern "$1" | md5sum)" ]
}

# check_stayed TAG MD COMMANDS MEMBER...: after a run, with the LVM tools that fail in it. It tries three
# times, and a second's pause follows each.
check_stayed() {
    tag=$1
    number=$2
    complaining=$3
    shift 3
    check_output "$tag" ''
    {
        lines "$complaining" | sed 's/^/err Failed to /'
        for _ in 1 2 3; do
            echo "err Failed to mdadm stop '/dev/md$number'"
            echo "err Fail to stop [/dev/md$number], try again"
        done
        echo 'err Reach RAID stop retry limit'
    } >"$EXPECTED"
    check_log "$tag"
    {
        lines "$complaining" | grep "/dev/md$number"
        for _ in 1 2 3; do
            echo "/sbin/mdadm -S /dev/md$number"
        done
    } >"$EXPECTED"
    complaints | grep "/dev/md$number" >"$SEEN"
    check 'operation error log' as_expected "$SEEN"
    check 'three pauses' slept 3 1 "$RUNS/$tag.sleeps"
    check 'runs' array_is_clean "$number"
    superblocks "$@" >"$SEEN"
    check 'superblocks' cmp "/tmp/superblocks$number" "$SEEN"
}

check_file() {
    check 'its file' file_is_whole "$1"
    check 'writable' sh -c "echo more >$1/more && sync"
}

partition_disks '4M 4M 12M ,E 12M 16M' sda sdb sdc sdd
array 2 '-l 5' sda3 sdb3 sdc3
make_file_system /dev/md2 /mounted
array 3 '-l 1' sda5 sdb5
fill md3
array 4 '-l 5' sda6 sdb6 sdc6
make_group group 4
make_volume group data 100%FREE
make_file_system /dev/group/data /volume
settle 2 3 4
superblocks sda3 sdb3 sdc3 >/tmp/superblocks2
superblocks sda5 sdb5 >/tmp/superblocks3
superblocks sda6 sdb6 sdc6 >/tmp/superblocks4

tail -f /dev/null 3</dev/md3 &
holder=$!
await test -e "/proc/$holder/fd/3"
run_destroy held 3 &
held_run=$!

run_destroy mounted 2
check_stayed mounted 2 '' sda3 sdb3 sdc3
check_file /mounted
verdict 'a mounted array stays'

# Mounted under its own name, which is not what is looked for: the volume is not unmounted.
run_destroy volume 4
check_stayed volume 4 '/sbin/lvremove -f /dev/group/data
/sbin/vgremove -f /dev/group
/sbin/pvremove -f /dev/md4' sda6 sdb6 sdc6
check_file /volume
check 'group' vgs group
verdict 'an array under a mounted volume stays'

# mdadm itself tries for five seconds each time, so it runs beside the others.
wait "$held_run"
check_stayed held 3 '' sda5 sdb5
check 'its data' holds md3
verdict 'an array that a program holds open stays'

kill "$holder"
wait "$holder"
destroys free 3 '' sda5 sdb5
verdict 'the same array goes once it is free'

finds_nothing absent 99
echo 'debug Failed to open /dev/md99, errno=No such file or directory' >"$EXPECTED"
check_log absent
verdict 'an array without a node'

must mknod /dev/md98 b 9 98
finds_nothing hollow 98
{
    echo 'debug Failed to ioctl for raid status, errno=No such device'
    echo 'debug Failed to ioctl for raid status, errno=0X8000'
} >"$EXPECTED"
check_log hollow
verdict 'a node without an array'

finds_nothing another 97000
finds_nothing zero 0
verdict 'other numbers'

must umount /mounted
stop_arrays 2
superblocks sda3 sdb3 sdc3 >/tmp/stopped
must mknod /dev/md2 b 9 2
finds_nothing stopped 2
superblocks sda3 sdb3 sdc3 >"$SEEN"
check 'superblocks' cmp /tmp/stopped "$SEEN"
check 'assembles' mdadm --assemble /dev/md2 /dev/sda3 /dev/sdb3 /dev/sdc3
verdict 'a stopped array is not found, and its superblocks stay'

finish
