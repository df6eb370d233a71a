#!/bin/sh
# SPDX-License-Identifier: MIT
# A teardown is cut off at every place that the page of recovery tells of; what the page says ends it,
# or brings the array and its volume back with every byte.
# alone: yes
# disks: 4
# size: 4672M
# shellcheck disable=SC2046,SC2086,SC2154,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-recovery.sh
. /appliance/lib-recovery.sh
plan 8

check_gone() {
    check 'the array has gone' comes array_left_nothing 2
    check 'no superblock' have_no_superblock sda3 sdb3 sdc3 sdd3
    check 'nor on the rest of them' carry_system
}

carry_system() {
    for disk in $ALL; do
        mdadm -E "/dev/${disk}1" "/dev/${disk}2" || return 1
    done
}


slow_resync
bays 0xf
stand_in

for place in 'before mdadm -S *' 'behind mdadm -S *'; do
    with_data "$WHOLE_8"
    must assembles
    cut_at "${place%% *}" "${place#* }" 1 '' 0 destroy 2
    forget
    check 'what one sees' looks_like 11
    check 'again' says 0 'Not found /dev/md2 \n' arrayctl destroy 2
    way_back 11
    check_gone
    sed -n 's/^mdadm --zero-superblock //p' "$RAN" | tail -n 4 >/tmp/wiped
done
verdict 'row 11: destroy was cut off before it erased'

with_data "$WHOLE_8"
must assembles
cut_at behind 'mdadm --zero-superblock *' 1 '' 0 destroy 2
forget
check 'what one sees' looks_like 12
check 'again' says 0 'Not found /dev/md2 \n' arrayctl destroy 2
with MEMBERS="$(members_left)"
way_back 12
check_gone
verdict 'row 12: destroy had erased a few superblocks'

# They go in the order of a hash.
with_data "$WHOLE_8"
must assembles
cut_at behind "mdadm --zero-superblock $(sed -n 2p /tmp/wiped)" 1 '' 0 destroy 2
forget
check 'what one sees' looks_like 13
check 'again' says 0 'Not found /dev/md2 \n' arrayctl destroy 2
check 'it does not assemble' is_not assembles
forget
with MEMBERS="$(members_left)"
way_back 13
check_gone
verdict 'row 13: more were erased than the level bears'

with_partitions "$WHOLE_8"
with_system_arrays
array 2 '-l 5 --write-journal /dev/sdd3' sda3 sdb3 sdc3
check 'destroy' says 0 '' arrayctl destroy 2
check 'all are left' [ "$(members_left)" = '/dev/sda3 /dev/sdb3 /dev/sdc3 /dev/sdd3 ' ]
with MEMBERS="$(members_left)"
way_back 13
check_gone
verdict 'row 13: superblocks are left by a journal'

# The last-named member is asked for the UUID: when it is not there, nothing is erased.
for pulled in 'sda 0 /dev/sda3' 'sdd 3 /dev/sda3 /dev/sdb3 /dev/sdc3 /dev/sdd3'; do
    with_data "$WHOLE_8"
    must assembles
    pull_disk "${pulled%% *}"
    check 'destroy' says 0 '' arrayctl destroy 2
    pulled=${pulled#* }
    echo "0 ${pulled%% *} 0" >/sys/class/scsi_host/host0/scan
    for disk in $ALL; do
        await test -b "/dev/${disk}3"
    done
    check 'what is left' [ "$(members_left)" = "${pulled#* } " ]
    with MEMBERS="$(members_left)"
    way_back 13
    check_gone
done
verdict 'row 13: superblocks are left on a disk that was pulled'

for place in lvremove pvremove; do
    with_volume
    cut_at behind "$place *" 1 '' 0 destroy 2
    forget
    check 'what one sees' looks_like 14
    way_back 14
    with GROUP=vg1 VOLUME=volume SIZE=100%FREE
    way_back 14 volume
    check_volume
done
verdict 'row 14: destroy is regretted, the volume is gone'

with_volume
check 'destroy' says 0 '' arrayctl destroy 2
check 'what one sees' looks_like 15
with LEVEL=5
way_back 15
with GROUP=vg1 VOLUME=volume SIZE=100%FREE
way_back 15 volume
check_volume
verdict 'row 15: destroy is regretted, the superblocks are gone'

# A member that was not rebuilt is left out of it.
with_partitions "$WHOLE_8"
with_system_arrays
must arrayctl newvol
store_data md2
picture md2 >/tmp/before
check 'destroy' says 0 '' arrayctl destroy 2
with LEVEL=5 MEMBERS='/dev/sda3 /dev/sdb3 /dev/sdc3 missing'
way_back 15
picture md2 >/tmp/now
check 'every byte' cmp /tmp/before /tmp/now
check 'its files' data_is_whole md2
verdict 'row 15: an array that was still being built'
finish
