#!/bin/sh
# SPDX-License-Identifier: MIT
# Healthy arrays of every level, both superblock formats, large and small; and arrays that are none.
# disks: 4
# size: 6G
# shellcheck disable=SC2086  # lists of words
# shellcheck source=SCRIPTDIR/../lib.sh
. /appliance/lib.sh
plan 17

partition_disks '64M 64M 64M' sda sdb sdc sdd

# level_case NAME LEVEL WORD FORMAT MEMBER...
level_case() {
    name=$1
    level=$2
    word=$3
    format=$4
    shift 4
    lines=
    for member in "$@"; do
        lines="$member $lines"
    done
    array 2 "-e $format -l $level" "$@"
    check_status "$name" 2 clean "$word" $lines
    drop_arrays 2
}

level_case 'RAID 0 of two' raid0 'RAID 0' 1.2 sda1 sdb1
level_case 'RAID 0 of four' raid0 'RAID 0' 1.0 sda1 sdb1 sdc1 sdd1
level_case 'RAID 1 of two' raid1 'RAID 1' 1.2 sda1 sdb1
level_case 'RAID 1 of four with a 0.90 superblock' raid1 'RAID 1' 0.90 sda1 sdb1 sdc1 sdd1
level_case 'RAID 4 has no word' raid4 '' 1.2 sda1 sdb1 sdc1
level_case 'RAID 5 of three' raid5 'RAID 5' 1.2 sda1 sdb1 sdc1
level_case 'RAID 5 with a 0.90 superblock' raid5 'RAID 5' 0.90 sda1 sdb1 sdc1 sdd1
level_case 'RAID 6 of four' raid6 'RAID 6' 1.2 sda1 sdb1 sdc1 sdd1
level_case 'RAID 10 of four' raid10 'RAID_10' 1.2 sda1 sdb1 sdc1 sdd1
if has_linear; then
    level_case 'linear of two' linear JBOD 1.2 sda1 sdb1
    level_case 'linear with a 0.90 superblock' linear JBOD 0.90 sda1 sdb1 sdc1
else
    check_no_linear 'linear of two' 2 '-e 1.2' sda1 sdb1
    check_no_linear 'linear with a 0.90 superblock' 2 '-e 0.90' sda1 sdb1 sdc1
fi

# A 64 MiB partition under a 0.90 superblock gives its last 64 KiB, and no more.
array 0 '-e 0.90 -l 1' sda2 sdb2
report 0 NORMAL None 'RAID 1' 67043328 sdb2 sda2 >"$EXPECTED"
check 'report' answers 0 arrayctl status 0
verdict 'the size of a small mirror to the byte'
drop_arrays 0

array 12 '-l 1' sdc4 sdd4
check_status 'a mirror of more than 4 GiB' 12 clean 'RAID 1' sdd4 sdc4
drop_arrays 12

array 3 '-l 0' sda4 sdb4 sdc4 sdd4
check_status 'a stripe of more than 16 GiB' 3 clean 'RAID 0' sdd4 sdc4 sdb4 sda4
drop_arrays 3

check_not_found 'an array without a node' 7

must mknod /dev/md9 b 9 9
check_not_found 'a node without an array' 9

# One member of two: the driver holds it, but does not start what it belongs to.
array 5 '-l 1' sda3 sdb3
stop_arrays 5
must mknod /dev/md5 b 9 5
echo 'ARRAY /dev/md5 name=appliance:5' >/etc/mdadm/mdadm.conf
must mdadm --incremental --no-degraded /dev/sda3
await grep -q '^md5 : inactive' /proc/mdstat
check_not_found 'an inactive array' 5

finish
