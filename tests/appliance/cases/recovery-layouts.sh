#!/bin/sh
# SPDX-License-Identifier: MIT
# The way back of rows 1, 2 and 4 with the numbers of layouts 6, 7 and 8.
# alone: yes
# disks: 4
# size: 4672M
# shellcheck disable=SC2046,SC2086,SC2154,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-recovery.sh
. /appliance/lib-recovery.sh
plan 7

slow_resync
bays 0xf
stand_in

# One after the other, as the data of one lies over that of another.
lose_system "$WHOLE_6"
numbers 6 RAID
way_back 1
check 'system arrays' system_arrays_are $ALL
check_way_back "$WHOLE_6"
verdict 'row 1: layout 6'

lose_system "$WHOLE_6"
must arrayctl_awake initsys
check_found 9430155
numbers 6 RAID
way_back 2
check_way_back "$LAYOUT_8
${WHOLE_6##*
}"
verdict 'row 2: layout 6, on disks of layout 8'

with_data "$WHOLE_6"
cut_at before 'sfdisk -N2 *' 4 '' 0 initsys
forget
check 'there is room' says 0 '' arrayctl_awake initsys
check_way_back "$LAYOUT_8
${WHOLE_6##*
}"
with_data "$WHOLE_6"
cut_at before 'sfdisk -N2 *' 4 '' 0 initsys
forget
numbers 6 RAID
way_back 4 stock
must arrayctl_awake initsys
check 'system arrays' system_arrays_are $ALL
check_way_back "$WHOLE_6"
verdict 'row 4: layout 6, on all disks'

lose_system "$WHOLE_7"
numbers 7 RAID
way_back 1
check 'system arrays' system_arrays_are $ALL
check_way_back "$WHOLE_7"
verdict 'row 1: layout 7'

lose_system "$WHOLE_7"
must arrayctl_awake initsys
check_found 9437184
numbers 7 RAID
way_back 2
check_way_back "$LAYOUT_8
${WHOLE_7##*
}"
verdict 'row 2: layout 7, on disks of layout 8'

lose_system "$WHOLE_8"
cut_at before 'sfdisk -N1 *sd[bc]' 2 'sfdisk -N2' 2 initsys
forget
numbers 8 RAID
way_back 2
check_tables "$WHOLE_8" $ALL
check_data
stop_arrays 2
check 'what follows' says 0 '' arrayctl_awake initsys
check_whole "$WHOLE_8"
verdict 'row 2: layout 8, and the second run was cut off'

with_data "$WHOLE_8"
: >/.force_clean_all_disk
check 'a run' says 0 '' arrayctl_awake initsys
rm /.force_clean_all_disk
check 'what one sees' looks_like 2
way_back 2
check_tables "$WHOLE_8" $ALL
check_data
forget
verdict 'row 2: layout 8, and it was to wipe all'
finish
