#!/bin/sh
# SPDX-License-Identifier: MIT
# An installation that is duplicated, and what a program that fails leaves of a data array.
# alone: yes
# disks: 4
# size: 4672M
# shellcheck disable=SC2046,SC2086,SC2154,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-recovery.sh
. /appliance/lib-recovery.sh
plan 7

block_of - 'sh look' >/tmp/look
slow_resync
bays 0xf
stand_in

printf '%s\n' '#!/bin/sh' 'exit 0' >/usr/bin/nurodd
chmod +x /usr/bin/nurodd
with_data "$WHOLE_8"
cut_at before 'sfdisk -N1 *' 4 '' 0 initsys-dd
forget
check 'what one sees' looks_like 1
way_back 1
check_whole "$WHOLE_8"
verdict 'row 1: an installation that is duplicated'

with_data "$WHOLE_8"
cut_at before 'mdadm -C /dev/md1 *' 1 '' 0 initsys-dd
check 'what one sees' looks_like 5
way_back 5
check_whole "$WHOLE_8"
verdict 'row 5: an installation that is duplicated'

# From here on the data is not what was kept.
with_partitions "$WHOLE_8"
check 'newvol' says 1 'Creating RAID 5 volume... \n' with_failing 'mdadm -C /dev/md2 *' arrayctl newvol
way_back 9
check 'the array' array_is 2 raid5 1.2 sda3 sdb3 sdc3 sdd3
verdict 'row 9: the data array could not be made'

with_data "$WHOLE_7"
check 'newvol' says 1 '' with_failing 'sfdisk -N3 *sdc' arrayctl newvol
check 'it stopped there' grep -q '^sdc 1:md0 2:md1$' "$(seen)"
check 'the first begins elsewhere' is_not table_is sda "$WHOLE_7"
way_back 10 stock
check_tables "$WHOLE_7" $ALL
check_data
verdict 'row 10: with the stock partitioner'

with_data "$WHOLE_8"
must assembles
check 'destroy' says 0 '' with_failing 'mdadm -S *' arrayctl destroy 2
check 'it runs' array_is 2 raid5 1.2 sda3 sdb3 sdc3 sdd3
way_back 11
check 'gone' comes array_left_nothing 2
check 'no superblock' have_no_superblock sda3 sdb3 sdc3 sdd3
verdict 'row 11: the array could not be stopped'

with_data "$WHOLE_8"
must assembles
check 'destroy' says 0 '' with_failing 'mdadm --zero-superblock *sdc3' arrayctl destroy 2
check 'it is left' sh -c 'mdadm -E /dev/sdc3'
check 'not all are' [ "$(members_left | wc -w)" -lt 4 ]
with MEMBERS="$(members_left)"
way_back 13
check 'no superblock' have_no_superblock sda3 sdb3 sdc3 sdd3
verdict 'row 13: a superblock could not be erased'

# What it computes for the member that it builds anew is what was there.
with_partitions "$WHOLE_8"
must arrayctl newvol
at_full_speed 2
await mdadm_state_is 2 clean
store_data md2
picture md2 >/tmp/before
forget
cut_at behind 'mdadm -C *' 1 '' 0 newvol
must mdadm -S /dev/md2
with LEVEL=5
way_back 15
picture md2 >/tmp/now
check 'every byte of it' cmp /tmp/before /tmp/now
check 'its files' data_is_whole md2
check 'its parity' parity_is_right 2
verdict 'row 15: newvol was cut off behind mdadm'
finish
