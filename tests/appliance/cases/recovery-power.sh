#!/bin/sh
# SPDX-License-Identifier: MIT
# The whole machine is switched off in the middle of an installation, of newvol and of a teardown. The
# next boot finds what the page of recovery shows, and types what stands there.
# alone: yes
# disks: 4
# size: 4672M
# boots: 4
# shellcheck disable=SC2046,SC2086,SC2154,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-recovery.sh
. /appliance/lib-recovery.sh
# Between swap and data, where no layout has anything.
NOTE=9200000

# What the next boot compares with.
leave_note() {
    must dd if=/tmp/before of=/dev/sda bs=512 seek="$NOTE" conv=notrunc,fsync
}

read_note() {
    dd if=/dev/sda bs=512 skip="$NOTE" count=1 2>/dev/null | tr -d '\0' >/tmp/before
    check 'a note' grep -q '^md2 [0-9a-f]\{32\}  -$' /tmp/before
}

check_switched_off() {
    check 'no array by itself' [ -z "$(arrays_known)" ]
    check 'what one sees' looks_like "$1"
}

off_in_initsys() {
    with_data "$WHOLE_8"
    leave_note
    holds_at before 'sfdisk -N1 *' 4 '' 0 initsys
    check 'all four wait' [ "$(grep -c . "$STAYED")" = 4 ]
    verdict 'the power goes in initsys'
    power_goes
}

off_in_newvol() {
    with_partitions "$WHOLE_8"
    holds_at before 'sfdisk -N3 *sdc' 1 '' 0 newvol
    check 'two are made' [ "$(grep -c 'sfdisk -N3' "$RAN")" = 2 ]
    verdict 'the power goes in newvol'
    power_goes
}

off_in_destroy() {
    with_data "$WHOLE_8"
    leave_note
    must assembles
    holds_at before 'mdadm -S *' 1 '' 0 destroy 2
    check 'it runs' [ "$(arrays_known)" = 2 ]
    verdict 'the power goes in destroy'
    power_goes
}

slow_resync
bays 0xf
case $1 in
1) plan 1 ;;
2)
    plan 2
    read_note
    check_switched_off 1
    stand_in
    way_back 1
    check_whole "$WHOLE_8"
    verdict 'row 1: the power went in initsys'
    ;;
3)
    plan 2
    check_switched_off 9
    stand_in
    way_back 9
    check_tables "$WHOLE_8" $ALL
    check 'the array' array_is 2 raid5 1.2 sda3 sdb3 sdc3 sdd3
    forget
    verdict 'row 9: the power went in newvol'
    ;;
4)
    plan 1
    read_note
    check_switched_off 11
    check 'assembles' assembles
    check_data
    forget
    stand_in
    way_back 11
    check 'the array has gone' comes array_left_nothing 2
    check 'no superblock' have_no_superblock sda3 sdb3 sdc3 sdd3
    verdict 'row 11: the power went in destroy'
    finish
    ;;
esac
[ -e /tmp/stays ] || stand_in
case $1 in
1) off_in_initsys ;;
2) off_in_newvol ;;
3) off_in_destroy ;;
esac
