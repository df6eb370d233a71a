#!/bin/sh
# SPDX-License-Identifier: MIT
# A rehearsal changes nothing, and its commands are those of the run that follows.
# disks: 4
# size: 4672M
# shellcheck disable=SC2086  # lists of words
# shellcheck source=SCRIPTDIR/../lib-rehearse.sh
. /appliance/lib-rehearse.sh
plan 5
record_calls
watched='sda sdb sdc sdd'
slow_resync

# comes_of TEXT STATUS COMMAND...: rehearsed without a warning, then run.
comes_of() {
    text=$1
    status=$2
    shift 2
    check "rehearsal of $*" lists 0 "$@"
    check 'it has commands' test -s "$REHEARSED"
    : >"$CALLS"
    check "$*" says "$status" "$text" arrayctl_awake "$@"
    check 'the same commands' comes_true
}

# A resync writes by itself.
hold_still() {
    for number in "$@"; do
        echo frozen >"/sys/block/md$number/md/sync_action"
        [ "$number" = 2 ] || echo none >"/sys/block/md$number/md/resync_start"
    done
    settle "$@"
}

comes_of '' 0 initsys
verdict 'initsys on blank disks'

stop_arrays 0 1
comes_of 'system init with nurodd failed\n' 0 initsys-dd
verdict 'initsys-dd on disks with a system'
hold_still 0 1

comes_of 'Creating RAID 5 volume... \n' 0 newvol
verdict 'newvol'

hold_still 2
check 'status' rehearses 0 status 2
arrayctl status 2 >/tmp/report
sed 's/^/  /' /tmp/report >"$EXPECTED"
sed -n '/^What it prints:/,/^What it logs:/p' "$TOLD" | sed -e '1d' -e '$d' -e '/^$/d' >"$SEEN"
check 'the report' as_expected "$SEEN"
check 'its status' tells 'Its exit status: 0'
verdict 'status prints what the tool prints'

# Not every machine has the programs for volumes.
! has_lvm || {
    make_group vg1 2
    make_volume vg1 volume_1 100%FREE
    must mkfs.ext4 -q -L films /dev/vg1/volume_1
    hold_still 2
}
comes_of '' 0 destroy 2
verdict 'destroy, with a volume where there can be one'
finish
