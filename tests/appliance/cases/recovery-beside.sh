#!/bin/sh
# SPDX-License-Identifier: MIT
# Two runs at once, and bad disks in the bays of a newvol: what the page of recovery says of them. One run
# is held at a command of its own while the other one comes to its end, so nothing is a race.
# alone: yes
# disks: 4
# size: 4672M
# shellcheck disable=SC2046,SC2086,SC2154,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-recovery.sh
. /appliance/lib-recovery.sh
plan 14

# first_ends STATUS TEXT: the run that was held.
first_ends() {
    goes_on
    check 'how the first one ends' [ "$held_status" = "$1" ]
    printf '%b' "$2" >"$EXPECTED"
    check 'what it says' as_expected /tmp/run.out
}

installed() {
    check_tables "$LAYOUT_8" $ALL
    check 'system arrays' system_arrays_are $ALL
}

has_new_array() {
    check 'the array' array_is 2 raid5 1.2 sda3 sdb3 sdc3 sdd3
    check_tables "$WHOLE_8" $ALL
}

check_destroyed() {
    check 'gone' comes array_left_nothing 2
    check 'no superblock' have_no_superblock sda3 sdb3 sdc3 sdd3
}

NEWVOL='Creating RAID 5 volume... \n'
block_of - 'sh look' >/tmp/look
slow_resync
bays 0xf
stand_in

# --- status beside the others

erased $ALL
holds_at before 'mdadm -C /dev/md1 *' 1 '' 0 initsys
report 0 NORMAL 'Progressing...[' 'RAID 1' "$(blockdev --getsize64 /dev/md0)" sdd1 sdc1 sdb1 sda1 >"$EXPECTED"
check 'status' beside answers 0 arrayctl status 0
first_ends 0 ''
installed
verdict 'status beside initsys'

stop_arrays 0 1
with_partitions "$WHOLE_8"
holds_at before 'sfdisk -N3 *sdb' 1 '' 0 newvol
watch_writes $ALL
echo 'RAID /dev/md2 is not found' >"$EXPECTED"
check 'status' beside answers 1 arrayctl status 2
check 'nothing is written' nothing_written
first_ends 0 "$NEWVOL"
has_new_array
verdict 'status beside newvol'

with_data "$WHOLE_8"
must assembles
holds_at before 'mdadm -S *' 1 '' 0 destroy 2
report 2 NORMAL None 'RAID 5' "$(blockdev --getsize64 /dev/md2)" sdd3 sdc3 sdb3 sda3 >"$EXPECTED"
check 'status' beside answers 0 arrayctl status 2
first_ends 0 ''
check_destroyed
verdict 'status beside destroy'

# --- two of a kind

for place in 'before mdadm -S *' 'behind mdadm -S *' 'behind mdadm --zero-superblock *'; do
    with_data "$WHOLE_8"
    must assembles
    holds_at "${place%% *}" "${place#* }" 1 '' 0 destroy 2
    seen=
    [ "${place%% *}" = before ] || seen='Not found /dev/md2 \n'
    check 'the second one' beside says 0 "$seen" arrayctl destroy 2
    first_ends 0 ''
    check_destroyed
done
verdict 'two destroy: both are clean'

with_partitions "$WHOLE_8"
holds_at before 'sfdisk -N3 *sdb' 1 '' 0 newvol
check 'the second one' beside says 0 "$NEWVOL" arrayctl newvol
first_ends 1 ''
has_new_array
verdict 'two newvol: the second one wins'

with_partitions "$WHOLE_8"
holds_at behind 'mdadm -C *' 1 '' 0 newvol
check 'the second one' beside says 1 '' arrayctl newvol
first_ends 0 "$NEWVOL"
has_new_array
verdict 'two newvol: the first one wins'

forget
erased $ALL
holds_at before 'sfdisk -N2 *sd[bcd]' 3 'sfdisk -N2' 1 initsys
check 'the second one' beside says 0 '' arrayctl_awake initsys
first_ends 0 ''
sh /tmp/look >"$SEEN"
check 'one of four' grep -qxF 'md0 [4/1]' "$SEEN"
way_back 5
installed
verdict 'row 5: two initsys on blank disks'

stop_arrays 0 1
with_data "$WHOLE_8"
holds_at behind 'sfdisk --fast-delete 1:2 *' 4 '' 0 initsys
check 'the second one' beside says 0 '' arrayctl_awake initsys
first_ends 1 ''
check 'what one sees' looks_like 2
way_back 2
check_data
forget
verdict 'row 2: two initsys with data'

# --- two kinds

with_data "$WHOLE_8"
holds_at before 'sfdisk -N1 *' 4 '' 0 initsys
check 'newvol' beside says 1 '' arrayctl newvol
first_ends 0 ''
check 'system arrays' system_arrays_are $ALL
check_tables "$LAYOUT_8" sda
check_tables "$WHOLE_8" sdb sdc sdd
way_back 10
check_tables "$WHOLE_8" $ALL
check_data
verdict 'row 10: newvol beside initsys'

with_partitions "$WHOLE_8"
holds_at before 'sfdisk -N3 *sdb' 1 '' 0 newvol
check 'initsys' beside says 0 '' arrayctl_awake initsys
first_ends 0 "$NEWVOL"
check 'system arrays' system_arrays_are $ALL
has_new_array
verdict 'initsys while newvol makes its partitions'

# --- bad disks in the bays of a newvol

THREE="DISKS=/dev/sda /dev/sdb /dev/sdc"
THREE_MEMBERS="MEMBERS=/dev/sda3 /dev/sdb3 /dev/sdc3"

# check_three TABLE: their array is back, without the bad disk's member.
check_three() {
    check_tables "$1" sda sdb sdc
    picture md2 >/tmp/now
    check 'every byte' cmp /tmp/before /tmp/now
    check 'its files' data_is_whole md2
    forget
}

forget
with_data "$WHOLE_8"
echo offline >/sys/block/sdd/device/state
check 'newvol' says 1 '' arrayctl newvol
echo running >/sys/block/sdd/device/state
check 'nothing shows it' looks_like whole
with "$THREE" "$THREE_MEMBERS"
way_back 10
check_three "$WHOLE_8"
verdict 'row 10: a dead disk behind the others'

with_data "$WHOLE_8"
erased sdd
check 'newvol' says 1 '' arrayctl newvol
with "$THREE" "$THREE_MEMBERS"
way_back 10
check_three "$WHOLE_8"
verdict 'row 10: a foreign disk behind the others'

with_data "$WHOLE_8"
bays 0x1f
# shellcheck disable=SC2119  # nothing but its defaults
debug_disk
check 'newvol' says 1 '' arrayctl newvol
way_back 10
check_tables "$WHOLE_8" $ALL
check_data
verdict 'row 10: a tiny disk behind the others'

# Last, as its data lies over that of layout 8.
bays 0xf
with_data "$WHOLE_7"
must blockdev --setro /dev/sdd
check 'newvol' says 1 '' arrayctl newvol
must blockdev --setrw /dev/sdd
for disk in sda sdb sdc; do
    check 'it begins elsewhere' is_not table_is "$disk" "$WHOLE_7"
done
check 'the last one is as it was' table_is sdd "$WHOLE_7"
with "$THREE" "$THREE_MEMBERS"
way_back 10
check_three "$WHOLE_7"
verdict 'row 10: a read-only disk behind the others, layout 7'
finish
