#!/bin/sh
# SPDX-License-Identifier: MIT
# What the page of recovery has an installer do first, and how it sees afterwards that it went well.
# alone: yes
# disks: 4
# size: 4672M
# shellcheck disable=SC2046,SC2086,SC2154,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-recovery.sh
. /appliance/lib-recovery.sh
plan 2

# begins STATUS "COMMAND" "WIPED": the installer's script.
begins() {
    COMMAND=$2 WIPED=$3 PATH=$AWAKE:$PATH sh /tmp/before.sh >/tmp/before.out 2>&1
    seen_status=$?
    [ "$seen_status" = "$1" ] && return
    echo "status $seen_status"
    cat /tmp/before.out
    return 1
}

said() {
    grep -qxF -- "$1" /tmp/before.out
}

installed() {
    check_tables "$LAYOUT_8" $ALL
    check 'system arrays' system_arrays_are $ALL
    sh /tmp/look >"$SEEN"
    check 'member counts' grep -qxF 'md0 [4/4]' "$SEEN"
    check 'member counts' grep -qxF 'md1 [4/4]' "$SEEN"
}

block_of - 'sh look' >/tmp/look
block_of - 'sh before' >/tmp/before.sh
slow_resync
bays 0xf

watch_writes $ALL
must blockdev --setro /dev/sdc
check 'a read-only disk' begins 1 initsys '1 2 3 4'
check 'which' said 'sdc: take it out of its bay'
must blockdev --setrw /dev/sdc
check 'data is expected' begins 1 initsys ''
check 'why' said 'other disks than expected'
sh -c 'exec 9>/run/arrayctl.lock; flock -n 9; echo >/tmp/locked; exec sleep 1000000' &
holder=$!
await test -e /tmp/locked
check 'another one' begins 1 initsys '1 2 3 4'
check 'why' said 'another run'
kill "$holder"
await flock -n /run/arrayctl.lock true
check 'nothing is written' nothing_written
verdict 'before: what keeps an installer from beginning'

check 'initsys' begins 0 initsys '1 2 3 4'
installed
check 'newvol' begins 0 newvol ''
check 'destroy' begins 0 'destroy 2' ''
check 'no superblock' have_no_superblock sda3 sdb3 sdc3 sdd3
forget
verdict 'before and afterwards: a machine is set up'
finish
