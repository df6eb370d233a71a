#!/bin/sh
# SPDX-License-Identifier: MIT
# What a program that fails leaves behind of an installation.
# alone: yes
# disks: 4
# size: 4672M
# shellcheck disable=SC2046,SC2086,SC2154,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-recovery.sh
. /appliance/lib-recovery.sh
plan 5

block_of - 'sh look' >/tmp/look
slow_resync
bays 0xf
stand_in

with_data "$WHOLE_8"
check 'initsys' says 0 '' with_failing 'sfdisk -N1 *sdb' arrayctl_awake initsys
check 'partition 3 alone' grep -qx 'sdb 3:md2' "$(seen)"
with DISKS=/dev/sdb
way_back 1
check_whole "$WHOLE_8"
verdict 'row 1: the system partition could not be made'

with_data "$WHOLE_8"
check 'initsys' says 0 '' with_failing 'sfdisk -N2 *sdb' arrayctl_awake initsys
check 'no partition 2' grep -q '^sdb 1:[^ ]* 3:md2$' "$(seen)"
with DISKS=/dev/sdb
way_back 4
check_whole "$WHOLE_8"
verdict 'row 4: the swap partition could not be made'

with_data "$WHOLE_8"
cut_at before 'sfdisk -N2 *sdb' 1 'sfdisk -N2' 3 initsys
forget
with DISKS=/dev/sdb
way_back 4 stock
must arrayctl_awake initsys
check_whole "$WHOLE_8"
verdict 'row 4: with the stock partitioner'

for number in 0 1; do
    with_data "$WHOLE_8"
    check 'initsys' says 0 '' with_failing "mdadm -C /dev/md$number *" arrayctl_awake initsys
    check 'it is not there' is_not grep -q "^md$number" "$(seen)"
    way_back 5
    check_whole "$WHOLE_8"
done
verdict 'row 5: a system array could not be made'

erased $ALL
check 'initsys' says 0 '' with_failing 'sfdisk -N2 *sda' arrayctl_awake initsys
check 'one alone' grep -q '^sda 1:[^ ]*$' "$(seen)"
with DISKS=/dev/sda
way_back 6 stock
must arrayctl_awake initsys
check_tables "$LAYOUT_8" $ALL
check 'system arrays' system_arrays_are $ALL
stop_arrays 0 1
verdict 'row 6: with the stock partitioner'
finish
