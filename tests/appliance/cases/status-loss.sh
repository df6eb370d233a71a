#!/bin/sh
# SPDX-License-Identifier: MIT
# Members that failed, were taken out, stand by, or are too many to lose.
# disks: 6
# size: 1G
# shellcheck source=SCRIPTDIR/../lib.sh
. /appliance/lib.sh
plan 20

partition_disks '64M 64M' sda sdb sdc sdd sde sdf

array 1 '-l 1' sda1 sdb1
fail_member 1 sda1
check_status 'a failed member that is still listed' 1 'clean, degraded' 'RAID 1' sdb1 sda1:Failed
must mdadm /dev/md1 --remove /dev/sda1
check_status 'the same when it was taken out' 1 'clean, degraded' 'RAID 1' sdb1
# The driver refuses to fail the last one, and calls the array broken.
break_array 1 sdb1
check_report 'a mirror that lost its last member' 1 CRASHED None 'RAID 1' sdb1
drop_arrays 1

array 1 '-e 0.90 -l 1' sda1 missing sdc1 missing
check_status 'a mirror with empty slots' 1 'clean, degraded' 'RAID 1' sdc1 sda1
drop_arrays 1

make_array 1 --assume-clean -l 1 -n 2 -x 1 /dev/sda1 /dev/sdb1 /dev/sdc1
check_status 'a mirror with a spare' 1 clean 'RAID 1' 'sdc1:Spare Disk' sdb1 sda1
drop_arrays 1

array 5 '-l 5' sda1 sdb1 sdc1
fail_member 5 sdb1
check_status 'RAID 5 without one' 5 'clean, degraded' 'RAID 5' sdc1 sdb1:Failed sda1
fail_member 5 sdc1
check_status 'RAID 5 without two' 5 'clean, FAILED' 'RAID 5' sdc1:Failed sdb1:Failed sda1
drop_arrays 5

array 6 '-e 0.90 -l 6' sda1 sdb1 sdc1 sdd1
fail_member 6 sdd1
check_status 'RAID 6 without one' 6 'clean, degraded' 'RAID 6' sdd1:Failed sdc1 sdb1 sda1
fail_member 6 sda1
check_status 'RAID 6 without two' 6 'clean, degraded' 'RAID 6' sdd1:Failed sdc1 sdb1 sda1:Failed
fail_member 6 sdb1
check_status 'RAID 6 without three' 6 'clean, FAILED' 'RAID 6' sdd1:Failed sdc1 sdb1:Failed sda1:Failed
drop_arrays 6

# Near copies: sda and sdb hold the same, and so do sdc and sdd.
array 10 '-l 10' sda1 sdb1 sdc1 sdd1
fail_member 10 sda1
check_status 'RAID 10 without one' 10 'clean, degraded' 'RAID_10' sdd1 sdc1 sdb1 sda1:Failed
fail_member 10 sdd1
check_status 'RAID 10 without one of each pair' 10 'clean, degraded' 'RAID_10' \
    sdd1:Failed sdc1 sdb1 sda1:Failed
break_array 10 sdb1
check_report 'RAID 10 without a pair' 10 CRASHED None 'RAID_10' sdd1:Failed sdc1 sdb1 sda1:Failed
drop_arrays 10

array 0 '-l 0' sda1 sdb1
break_array 0 sda1
check_report 'RAID 0 with a fault' 0 CRASHED None 'RAID 0' sdb1 sda1
drop_arrays 0

if has_linear; then
    array 7 '-l linear' sda1 sdb1
    break_array 7 sdb1
    check_report 'linear with a fault' 7 CRASHED None JBOD sdb1 sda1
    drop_arrays 7
else
    check_no_linear 'linear with a fault' 7 '' sda1 sdb1
fi

# Real drives that disappear. The driver finds out when it next writes to them.
array 1 '-l 1' sde1 sdf1
array 5 '-l 5' sdd1 sde2 sdf2
array 0 '-l 0' sdd2 sdf3
settle 1 5
pull_disk sdf
[ "$(cat /sys/block/md1/md/degraded)" = 0 ] || abort "md1 knows already"
check_report 'a mirror whose pulled member nobody missed yet' 1 NORMAL None 'RAID 1' sdf1 sde1
for number in 1 5 0; do
    dd if=/dev/zero of=/dev/md$number bs=1M count=4 oflag=direct >/dev/null 2>&1
done
check_status 'a mirror with a pulled member' 1 'clean, degraded' 'RAID 1' sdf1:Failed sde1
check_status 'RAID 5 with a pulled member' 5 'clean, degraded' 'RAID 5' sdf2:Failed sde2 sdd1
await grep -q broken /sys/block/md0/md/array_state
check_report 'RAID 0 with a pulled member' 0 CRASHED None 'RAID 0' sdf3 sdd2

pull_disk sde
dd if=/dev/zero of=/dev/md5 bs=1M count=4 oflag=direct >/dev/null 2>&1
check_status 'RAID 5 with two pulled members' 5 'clean, FAILED' 'RAID 5' sdf2:Failed sde2:Failed sdd1

finish
