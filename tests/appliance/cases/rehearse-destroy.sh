#!/bin/sh
# SPDX-License-Identifier: MIT
# A rehearsal of destroy leaves every sector of every disk as it is, and says what would be lost.
# disks: 4
# size: 72M
# shellcheck disable=SC2086,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-rehearse.sh
. /appliance/lib-rehearse.sh
plan 4
record_calls
watched='sda sdb sdc sdd'

# same_sectors STATUS COMMAND...: rehearsed, with every sector as before.
same_sectors() {
    picture $watched >/tmp/picture
    rehearses "$@" || return 1
    picture $watched >/tmp/picture.now
    diff /tmp/picture /tmp/picture.now
}

no_rehearsal() {
    for process in /proc/[0-9]*; do
        case $(readlink "$process/exe") in
        */arrayctl-rehearse | */mdrequests) return 1 ;;
        esac
    done
}

partition_disks '4M 4M 24M ,E 24M' sda sdb sdc sdd
array 2 '-l 5' sda3 sdb3 sdc3
make_group vg1 2
make_volume vg1 volume_1 100%FREE
must mkfs.ext4 -q -L films /dev/vg1/volume_1
settle 2

check 'destroy 2' same_sectors 0 destroy 2
check 'the array' tells 'array /dev/md2, raid5 on sda3, sdb3, sdc3: lost with 3 of 3 members'
check 'the group' tells 'group vg1 on /dev/md2, volumes: volume_1'
check 'the file system' grep -q 'ext4 "films" on /dev/vg1/volume_1, ' "$TOLD"
check 'a disk that stays' grep -q '^  /dev/sdd .* -> left alone$' "$TOLD"
verdict 'what is lost, in words'

check 'for programs' sh -c 'arrayctl-rehearse --json destroy 2 | grep -q "\"status\": 0"'
mv /usr/sbin/lvm /usr/sbin/lvm.away
check 'without LVM' rehearses 3 destroy 2
check 'the volume would hold it' grep -q '^  /dev/md2 is in use (held by dm-0): it will not stop' "$TOLD"
mv /usr/sbin/lvm.away /usr/sbin/lvm
verdict 'without a program'

# Killed while it runs, nothing of it stays.
for round in 1 2 3 4 5 6; do
    state >/tmp/state
    arrayctl-rehearse destroy 2 >/dev/null 2>&1 &
    sleep "0.$round"
    kill -KILL "$!" 2>/dev/null
    wait "$!" 2>/dev/null
    check "killed after 0.$round s" comes no_rehearsal
    state >/tmp/state.now
    check "as before, killed after 0.$round s" diff /tmp/state /tmp/state.now
done
verdict 'killed, it leaves nothing'

: >"$CALLS"
arrayctl-rehearse --commands destroy 2 >"$REHEARSED"
check 'destroy 2' says 0 '' arrayctl destroy 2
check 'the same commands' comes_true
verdict 'and the run that follows'
finish
