#!/bin/sh
# SPDX-License-Identifier: MIT
# Members that failed, were taken out, stand by, or are too many to lose.
# disks: 6
# size: 1G
# shellcheck source=SCRIPTDIR/../lib.sh
. /appliance/lib.sh
plan 20

partition_disks '64M 64M' sda sdb sdc sdd sde sdf

all1='/dev/sda1 /dev/sdb1 /dev/sdc1 /dev/sdd1'

make_array 1 -e 1.2 --level=1 --raid-devices=2 --assume-clean /dev/sda1 /dev/sdb1
fail_member 1 sda1
check_status 'a failed member that is still listed' 1 'clean, degraded' DEGRADE None 'RAID 1' \
    sdb1:Normal sda1:Failed
must mdadm /dev/md1 --remove /dev/sda1
check_status 'the same when it was taken out' 1 'clean, degraded' DEGRADE None 'RAID 1' sdb1:Normal
# The driver refuses to fail the last one, and calls the array broken.
break_array 1 sdb1
report 1 CRASHED None 'RAID 1' "$(array_bytes 1)" sdb1:Normal >"$EXPECTED"
check_run 'a mirror that lost its last member' 0 arrayctl status 1
drop_array 1 /dev/sda1 /dev/sdb1

make_array 1 -e 0.90 --level=1 --raid-devices=4 --assume-clean /dev/sda1 missing /dev/sdc1 missing
check_status 'a mirror with empty slots' 1 'clean, degraded' DEGRADE None 'RAID 1' \
    sdc1:Normal sda1:Normal
drop_array 1 /dev/sda1 /dev/sdc1

make_array 1 -e 1.2 --level=1 --raid-devices=2 --assume-clean --spare-devices=1 \
    /dev/sda1 /dev/sdb1 /dev/sdc1
check_status 'a mirror with a spare' 1 clean NORMAL None 'RAID 1' \
    'sdc1:Spare Disk' sdb1:Normal sda1:Normal
drop_array 1 /dev/sda1 /dev/sdb1 /dev/sdc1

make_array 5 -e 1.2 --level=5 --raid-devices=3 --assume-clean /dev/sda1 /dev/sdb1 /dev/sdc1
fail_member 5 sdb1
check_status 'RAID 5 without one' 5 'clean, degraded' DEGRADE None 'RAID 5' \
    sdc1:Normal sdb1:Failed sda1:Normal
fail_member 5 sdc1
check_status 'RAID 5 without two' 5 'clean, FAILED' CRASHED None 'RAID 5' \
    sdc1:Failed sdb1:Failed sda1:Normal
drop_array 5 /dev/sda1 /dev/sdb1 /dev/sdc1

# shellcheck disable=SC2086
make_array 6 -e 0.90 --level=6 --raid-devices=4 --assume-clean $all1
fail_member 6 sdd1
check_status 'RAID 6 without one' 6 'clean, degraded' DEGRADE None 'RAID 6' \
    sdd1:Failed sdc1:Normal sdb1:Normal sda1:Normal
fail_member 6 sda1
check_status 'RAID 6 without two' 6 'clean, degraded' DEGRADE None 'RAID 6' \
    sdd1:Failed sdc1:Normal sdb1:Normal sda1:Failed
fail_member 6 sdb1
check_status 'RAID 6 without three' 6 'clean, FAILED' CRASHED None 'RAID 6' \
    sdd1:Failed sdc1:Normal sdb1:Failed sda1:Failed
# shellcheck disable=SC2086
drop_array 6 $all1

# Near copies: sda and sdb hold the same, and so do sdc and sdd.
# shellcheck disable=SC2086
make_array 10 -e 1.2 --level=10 --raid-devices=4 --assume-clean $all1
fail_member 10 sda1
check_status 'RAID 10 without one' 10 'clean, degraded' DEGRADE None 'RAID_10' \
    sdd1:Normal sdc1:Normal sdb1:Normal sda1:Failed
fail_member 10 sdd1
check_status 'RAID 10 without one of each pair' 10 'clean, degraded' DEGRADE None 'RAID_10' \
    sdd1:Failed sdc1:Normal sdb1:Normal sda1:Failed
break_array 10 sdb1
report 10 CRASHED None 'RAID_10' "$(array_bytes 10)" \
    sdd1:Failed sdc1:Normal sdb1:Normal sda1:Failed >"$EXPECTED"
check_run 'RAID 10 without a pair' 0 arrayctl status 10
# shellcheck disable=SC2086
drop_array 10 $all1

make_array 0 -e 1.2 --level=0 --raid-devices=2 /dev/sda1 /dev/sdb1
break_array 0 sda1
report 0 CRASHED None 'RAID 0' "$(array_bytes 0)" sdb1:Normal sda1:Normal >"$EXPECTED"
check_run 'RAID 0 with a fault' 0 arrayctl status 0
drop_array 0 /dev/sda1 /dev/sdb1

make_array 7 -e 1.2 --level=linear --raid-devices=2 /dev/sda1 /dev/sdb1
break_array 7 sdb1
report 7 CRASHED None JBOD "$(array_bytes 7)" sdb1:Normal sda1:Normal >"$EXPECTED"
check_run 'linear with a fault' 0 arrayctl status 7
drop_array 7 /dev/sda1 /dev/sdb1

# Real drives that disappear. The driver finds out when it next writes to them.
make_array 1 -e 1.2 --level=1 --raid-devices=2 --assume-clean /dev/sde1 /dev/sdf1
make_array 5 -e 1.2 --level=5 --raid-devices=3 --assume-clean /dev/sdd1 /dev/sde2 /dev/sdf2
make_array 0 -e 1.2 --level=0 --raid-devices=2 /dev/sdd2 /dev/sdf3
pull_disk sdf
[ "$(cat /sys/block/md1/md/degraded)" = 0 ] || abort "md1 knows already"
report 1 NORMAL None 'RAID 1' "$(array_bytes 1)" sdf1:Normal sde1:Normal >"$EXPECTED"
check_run 'a mirror whose pulled member nobody missed yet' 0 arrayctl status 1
for number in 1 5 0; do
    dd if=/dev/zero of=/dev/md$number bs=1M count=4 oflag=direct >/dev/null 2>&1
done
check_status 'a mirror with a pulled member' 1 'clean, degraded' DEGRADE None 'RAID 1' \
    sdf1:Failed sde1:Normal
check_status 'RAID 5 with a pulled member' 5 'clean, degraded' DEGRADE None 'RAID 5' \
    sdf2:Failed sde2:Normal sdd1:Normal
wait_for_broken 0
report 0 CRASHED None 'RAID 0' "$(array_bytes 0)" sdf3:Normal sdd2:Normal >"$EXPECTED"
check_run 'RAID 0 with a pulled member' 0 arrayctl status 0

pull_disk sde
dd if=/dev/zero of=/dev/md5 bs=1M count=4 oflag=direct >/dev/null 2>&1
check_status 'RAID 5 with two pulled members' 5 'clean, FAILED' CRASHED None 'RAID 5' \
    sdf2:Failed sde2:Failed sdd1:Normal

finish
