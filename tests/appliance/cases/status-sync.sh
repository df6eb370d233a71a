#!/bin/sh
# SPDX-License-Identifier: MIT
# Arrays at work: resync, recovery, check, and the same while they wait for one another.
# disks: 4
# size: 2G
# shellcheck source=SCRIPTDIR/../lib.sh
. /appliance/lib.sh
plan 12

partition_disks '128M 128M 128M' sda sdb sdc sdd
slow_resync

make_array 1 -e 1.2 --level=1 --raid-devices=2 /dev/sda1 /dev/sdb1
check_status 'a mirror that resyncs' 1 'clean, resyncing' 'RAID 1' sdb1 sda1

# The driver works on one array at a time where arrays share a disk.
make_array 2 -e 0.90 --level=1 --raid-devices=2 /dev/sda2 /dev/sdb2
check_status 'a mirror that waits for the other' 2 'clean, resyncing (DELAYED)' 'RAID 1' sdb2 sda2

fast_resync
check_status 'the first when it is done' 1 clean 'RAID 1' sdb1 sda1
check_status 'the other when it is done' 2 clean 'RAID 1' sdb2 sda2
slow_resync

echo check >/sys/block/md1/md/sync_action
check_status 'a check' 1 'clean, checking' 'RAID 1' sdb1 sda1
echo idle >/sys/block/md1/md/sync_action

must mdadm /dev/md1 --fail /dev/sda1 --remove /dev/sda1
must mdadm /dev/md1 --add /dev/sdc1
check_status 'a mirror that rebuilds on a new disk' 1 'clean, degraded, recovering' 'RAID 1' \
    sdc1:Rebuilding sdb1

must mdadm /dev/md2 --fail /dev/sda2 --remove /dev/sda2
must mdadm /dev/md2 --add /dev/sdc2
check_status 'a mirror that waits to rebuild' 2 'clean, degraded, resyncing (DELAYED)' 'RAID 1' \
    sdc2:Rebuilding sdb2

fast_resync
check_status 'a mirror that is whole again' 1 clean 'RAID 1' sdc1 sdb1
await mdadm_state_is 2 clean
drop_arrays 1 2
slow_resync

# mdadm starts a new RAID 5 as a degraded one that rebuilds on its last member.
make_array 3 -e 1.2 --level=5 --raid-devices=3 /dev/sda3 /dev/sdb3 /dev/sdc3
check_status 'a new RAID 5' 3 'clean, degraded, recovering' 'RAID 5' sdc3:Rebuilding sdb3 sda3
drop_arrays 3

make_array 4 -e 1.2 --level=6 --raid-devices=4 /dev/sda3 /dev/sdb3 /dev/sdc3 /dev/sdd3
check_status 'a new RAID 6' 4 'clean, resyncing' 'RAID 6' sdd3 sdc3 sdb3 sda3
drop_arrays 4

make_array 4 -e 1.2 --level=10 --raid-devices=4 /dev/sda3 /dev/sdb3 /dev/sdc3 /dev/sdd3
check_status 'a new RAID 10' 4 'clean, resyncing' 'RAID_10' sdd3 sdc3 sdb3 sda3

# Started read-only until the first write, it has its resync before it.
stop_arrays 4
echo 1 >/sys/module/md_mod/parameters/start_ro
must mdadm --assemble /dev/md4 /dev/sda3 /dev/sdb3 /dev/sdc3 /dev/sdd3
check_status 'a resync that is due' 4 'clean, resyncing (PENDING)' 'RAID_10' sdd3 sdc3 sdb3 sda3

finish
