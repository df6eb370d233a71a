#!/bin/sh
# SPDX-License-Identifier: MIT
# The life of a machine: blank disks, arrays, data, a drive that is pulled and comes back, a reboot,
# and the end of the data array.
# disks: 4
# size: 4672M
# boots: 2
# core: yes
# shellcheck disable=SC2317  # check must call the functions
# shellcheck source=SCRIPTDIR/../lib-setup.sh
. /appliance/lib-setup.sh

# An array learns that a drive is gone when it next writes to it, which a few stripes make sure of.
# They are given what they hold.
find_out() {
    for number in "$@"; do
        must dd if="/dev/md$number" of=/tmp/stripes bs=1M count=4
        must dd if=/tmp/stripes of="/dev/md$number" bs=1M oflag=direct
        await grep -qx 1 "/sys/block/md$number/md/degraded"
    done
}

if [ "$1" = 1 ]; then
    plan 10
    slow_resync
    check 'four blank disks' enum_says 4 '1 2 3 4 '
    check 'initsys' says 0 '' arrayctl initsys
    check 'system arrays' system_arrays_are sda sdb sdc sdd
    # As if the first resync had come to its end. It would keep a data array on the same disks waiting.
    for number in 0 1; do
        echo frozen >"/sys/block/md$number/md/sync_action"
        echo none >"/sys/block/md$number/md/resync_start"
        echo idle >"/sys/block/md$number/md/sync_action"
    done
    check 'newvol' says 0 'Creating RAID 5 volume... \n' arrayctl newvol
    check_tables "$WHOLE_8" sda sdb sdc sdd
    check 'data array' array_is 2 raid5 1.2 sda3 sdb3 sdc3 sdd3
    check 'nothing to format' enum_says 0 ''
    verdict 'four blank disks are set up'
    check_status 'a new data array builds its redundancy' 2 'clean, degraded, recovering' 'RAID 5' \
        sdd3:Rebuilding sdc3 sdb3 sda3
    fast_resync
    check_status 'and has it' 2 clean 'RAID 5' sdd3 sdc3 sdb3 sda3
    check_status 'a system array with a disk in every slot' 0 clean 'RAID 1' sdd1 sdc1 sdb1 sda1
    store_data md2

    pull_disk sdc
    find_out 0 1 2
    check_status 'the data array without a drive' 2 'clean, degraded' 'RAID 5' sdd3 sdc3:Failed sdb3 sda3
    check_status 'the system array without it' 0 'clean, degraded' 'RAID 1' sdd1 sdc1:Failed sdb1 sda1
    check 'data' data_is_whole md2
    check 'nothing to format' enum_says 0 ''
    for number in 0 1 2; do
        must mdadm "/dev/md$number" --remove detached
    done
    verdict 'life goes on without a drive'

    echo '0 2 0' >/sys/class/scsi_host/host0/scan
    await test -b /dev/sdc3
    slow_resync
    must mdadm /dev/md2 -a /dev/sdc3
    check_status 'the drive is back' 2 'clean, degraded, recovering' 'RAID 5' sdd3 sdc3:Rebuilding sdb3 sda3
    fast_resync
    check_status 'and rebuilt' 2 clean 'RAID 5' sdd3 sdc3 sdb3 sda3
    check 'data' data_is_whole md2
    check_tables "$WHOLE_8" sda sdb sdc sdd
    verdict 'a drive comes back'
else
    plan 6
    check 'no array starts by itself' [ -z "$(arrays_known)" ]
    check 'nothing to format' enum_says 0 ''
    must mdadm --assemble --run /dev/md0 /dev/sda1 /dev/sdb1 /dev/sdd1
    must mdadm --assemble --run /dev/md1 /dev/sda2 /dev/sdb2 /dev/sdd2
    must mdadm --assemble /dev/md2 /dev/sda3 /dev/sdb3 /dev/sdc3 /dev/sdd3
    check 'data' data_is_whole md2
    verdict 'the data is there after a reboot'
    check_status 'the data array after a reboot' 2 clean 'RAID 5' sdd3 sdc3 sdb3 sda3
    check_status 'a system array that still lacks a disk' 0 'clean, degraded' 'RAID 1' sdd1 sdb1 sda1

    # Renewed system arrays take the drive in that came back, beside the data array that runs.
    slow_resync
    stop_arrays 0 1
    check_initsys sda sdb sdc sdd
    check 'data array' array_is 2 raid5 1.2 sda3 sdb3 sdc3 sdd3
    check 'data' data_is_whole md2
    verdict 'renewed system arrays have all disks'

    uuid=$(uuid_of 2)
    check 'destroy' says 0 '' arrayctl destroy 2
    check 'gone' comes array_left_nothing 2
    check 'no superblock' have_no_superblock sda3 sdb3 sdc3 sdd3
    check 'nor anywhere else' uuid_is_nowhere "$uuid"
    check 'system arrays' system_arrays_are sda sdb sdc sdd
    check_tables "$WHOLE_8" sda sdb sdc sdd
    check 'once more' says 0 'Not found /dev/md2 \n' arrayctl destroy 2
    verdict 'the data array is destroyed and the system left alone'
    check_not_found 'no data array' 2
fi
finish
