#!/bin/sh
# SPDX-License-Identifier: MIT
# The way back of rows 1, 2 and 4 with the numbers of layouts 1 and 2, with RAID.
# alone: yes
# disks: 4
# size: 4672M
# shellcheck disable=SC2046,SC2086,SC2154,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-recovery.sh
. /appliance/lib-recovery.sh
plan 5

slow_resync
bays 0xf
stand_in

# One after the other, as the data of one lies over that of another.
with_data "$WHOLE_1"
check 'a run that nobody cuts off' says 0 '' arrayctl_awake initsys
check_tables "$LAYOUT_1" $ALL
check_found 2634660
numbers 1 RAID
way_back 2
check_way_back "$WHOLE_1"
verdict 'row 2: layout 1, which every run wipes'

for kind in '' stock; do
    with_data "$WHOLE_1"
    cut_at before 'sfdisk -N2 *sd[bc]' 2 'sfdisk -N2' 2 initsys
    forget
    check_tables "${LAYOUT_1%
*}" sdb sdc
    numbers 1 RAID
    way_back 2 $kind
    check_way_back "$WHOLE_1"
done
verdict 'row 2: layout 1, and the run was cut off'

lose_system "$WHOLE_2"
numbers 2 RAID
way_back 1
check 'system arrays' system_arrays_are $ALL
check_way_back "$WHOLE_2"
verdict 'row 1: layout 2'

# Two disks still have all, so the machine keeps its layout and gives it to the others.
for kind in '' stock; do
    with_data "$WHOLE_2"
    cut_at before 'sfdisk -N1 *sd[bc]' 2 'sfdisk -N2' 2 initsys
    forget
    must arrayctl_awake initsys
    check_tables "$LAYOUT_2" sdb sdc
    check 'how it chose' grep -q 'biggest partition layout version 2' "$SYSLOG"
    with DISKS='/dev/sdb /dev/sdc'
    numbers 2 RAID
    way_back 2 $kind
    check_way_back "$WHOLE_2"
done
verdict 'row 2: layout 2, on some disks'

# With partitions 1 and 3 on all of them nothing tells their layout.
with_data "$WHOLE_2"
cut_at before 'sfdisk -N2 *' 4 '' 0 initsys
forget
check 'there is no room' says 1 '' arrayctl_awake initsys
numbers 2 RAID
way_back 4
check 'system arrays' system_arrays_are $ALL
check_way_back "$WHOLE_2"
verdict 'row 4: layout 2, on all disks'
finish
