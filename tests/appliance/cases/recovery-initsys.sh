#!/bin/sh
# SPDX-License-Identifier: MIT
# An installation is cut off at every place that the page of recovery tells of, and what the page says
# brings the machine back, with every byte of its data.
# alone: yes
# disks: 4
# size: 4672M
# shellcheck disable=SC2046,SC2086,SC2154,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-recovery.sh
. /appliance/lib-recovery.sh
plan 10

slow_resync
bays 0xf
stand_in

with_data "$WHOLE_8"
check 'as it should be' looks_like whole
cut_at before 'sfdisk -N1 *' 4 '' 0 initsys
forget
check 'what one sees' looks_like 1
way_back 1
check_whole "$WHOLE_8"
verdict 'row 1: partition 3 alone on all disks'

with_data "$WHOLE_8"
cut_at before 'sfdisk -N1 *sd[bc]' 2 'sfdisk -N2' 2 initsys
forget
check 'two of four' [ "$(sh /tmp/look | tail -n 1)" = 'format: 2 3' ]
with DISKS='/dev/sdb /dev/sdc'
way_back 1
check_whole "$WHOLE_8"
verdict 'row 1: partition 3 alone on some disks'

with_data "$WHOLE_8"
cut_at before 'sfdisk -N1 *' 4 '' 0 initsys
forget
way_back 1 stock
must arrayctl_awake initsys
check_whole "$WHOLE_8"
verdict 'row 1: with the stock partitioner'

with_data "$WHOLE_8"
cut_at before 'sfdisk -N1 *' 4 '' 0 initsys
forget
check 'again' says 0 '' arrayctl_awake initsys
check 'what one sees' looks_like 2
way_back 2
check 'tables' check_tables "$WHOLE_8" $ALL
check_data
forget
verdict 'row 2: initsys was run again'

with_data "$WHOLE_8"
cut_at before 'sfdisk -N1 *' 4 '' 0 initsys
forget
must arrayctl_awake initsys
way_back 2 stock
check 'tables' check_tables "$WHOLE_8" $ALL
check_data
forget
verdict 'row 2: with the stock partitioner'

with_data "$WHOLE_8"
cut_at before 'sfdisk -N2 *sdb' 1 'sfdisk -N2' 3 initsys
forget
check 'what one sees' looks_like 4
check 'it is left out' says 0 '' arrayctl_awake initsys
check 'of three disks' system_arrays_are sda sdc sdd missing
with DISKS=/dev/sdb
way_back 4
check_whole "$WHOLE_8"
verdict 'row 4: partitions 1 and 3 without 2'

with_data "$WHOLE_8"
cut_at before 'mdadm -C /dev/md1 *' 1 '' 0 initsys
check 'what one sees' looks_like 5
check 'again' says 1 '' arrayctl_awake initsys
way_back 5
check_whole "$WHOLE_8"
verdict 'row 5: all partitions and not all system arrays'

erased $ALL
cut_at before 'sfdisk -N2 *sda' 1 'sfdisk -N2' 3 initsys
forget
check 'what one sees' looks_like 6
check 'it is left out' says 0 '' arrayctl_awake initsys
check 'of three disks' system_arrays_are sdb sdc sdd missing
with DISKS=/dev/sda
way_back 6
check_tables "$LAYOUT_8" $ALL
check 'system arrays' system_arrays_are $ALL
stop_arrays 0 1
verdict 'row 6: partition 1 alone'

erased $ALL
cut_at before 'sfdisk -N1 *sda' 1 'sfdisk -N2' 3 initsys
forget
check 'what one sees' looks_like 7
way_back 7
check_tables "$LAYOUT_8" $ALL
check 'system arrays' system_arrays_are $ALL
stop_arrays 0 1
verdict 'row 7: blank disks that were not finished'

# A disk that failed in its bay.
erased $ALL
bays 0x7
must arrayctl_awake initsys
bays 0xf
check 'the others are in use' says 0 '' arrayctl_awake initsys
check 'what one sees' looks_like 8
with DISKS=/dev/sdd
way_back 8
for number in 0 1; do
    check 'it is taken in' [ -e "/sys/block/md$number/md/dev-sdd$((number + 1))" ]
done
sh /tmp/look >"$SEEN"
check 'a member of both' grep -qxF 'sdd 1:md0 2:md1' "$SEEN"
verdict 'row 8: a new disk beside arrays that run'
finish
