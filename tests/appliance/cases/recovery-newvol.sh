#!/bin/sh
# SPDX-License-Identifier: MIT
# The making of a data array is cut off, or ends early at a bad disk; what the page of recovery says ends
# it, or brings the array that was there back with every byte.
# alone: yes
# disks: 4
# size: 4672M
# shellcheck disable=SC2046,SC2086,SC2154,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-recovery.sh
. /appliance/lib-recovery.sh
plan 5

check_new() {
    check_tables "$WHOLE_8" $ALL
    check 'the array' array_is 2 raid5 1.2 sda3 sdb3 sdc3 sdd3
    stop_arrays 2
}

slow_resync
bays 0xf
stand_in

with_partitions "$WHOLE_8"
cut_at before 'sfdisk -N3 *sdc' 1 '' 0 newvol
forget
check 'what one sees' looks_like 9
way_back 9
check_new
verdict 'row 9: newvol was cut off'

# What hands over the members and is killed before it starts the array.
with_partitions "$WHOLE_8"
must mdadm -C /dev/md2 -R -l 5 -n 4 --assume-clean $(nodes sda3 sdb3 sdc3 sdd3)
stop_arrays 2
must mdadm -I --no-degraded /dev/sda3
check 'it has one' [ "$(cat /sys/block/md2/md/array_state)" = inactive ]
check 'newvol' says 1 '' arrayctl newvol
way_back 9
check_new
verdict 'row 9: an array that is not started'

with_data "$WHOLE_8"
cut_at before 'sfdisk -N3 *sdc' 1 '' 0 newvol
forget
check 'what one sees' looks_like 10
way_back 10
check_tables "$WHOLE_8" $ALL
check_data
stop_arrays 2
verdict 'row 10: newvol was cut off and the old data is wanted'

with_data "$WHOLE_8"
must blockdev --setro /dev/sdd
check 'newvol' says 1 '' arrayctl newvol
must blockdev --setrw /dev/sdd
with DISKS='/dev/sda /dev/sdb /dev/sdc' MEMBERS='/dev/sda3 /dev/sdb3 /dev/sdc3'
way_back 10
check_tables "$WHOLE_8" $ALL
picture md2 >/tmp/now
check 'every byte' cmp /tmp/before /tmp/now
check 'its files' data_is_whole md2
stop_arrays 2
verdict 'row 10: newvol ended early at a read-only disk'

with_data "$WHOLE_7"
cut_at before 'mdadm -C *' 1 '' 0 newvol
forget
check 'the others begin elsewhere' is_not table_is sda "$WHOLE_7"
way_back 10
check_tables "$WHOLE_7" $ALL
check_data
stop_arrays 2
verdict 'row 10: newvol was cut off, layout 7'
finish
