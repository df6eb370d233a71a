#!/bin/sh
# SPDX-License-Identifier: MIT
# Where there is no room for one byte or file more, installations come to their end as they would otherwise;
# LVM bears the first alone.
# alone: yes
# disks: 4
# size: 4672M
# shellcheck disable=SC2046,SC2086,SC2154,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-recovery.sh
. /appliance/lib-recovery.sh
plan 3

FOLDERS='/tmp /run /var/log /etc/lvm'

# What a program puts there when it can: lvm.conf is read, so it has to be where it was.
fill_up() { # FOLDER
    cp /etc/lvm/lvm.conf /appliance/lvm.conf
    mount -t tmpfs -o "size=64k,nr_inodes=$files" tmpfs "$1"
    [ "$1" != /etc/lvm ] || cp /appliance/lvm.conf /etc/lvm/
    head -c 1048576 /dev/zero >"$1/all" 2>/dev/null
    [ "$files" -lt 100 ] || return
    entry=0
    while mkdir "$1/$entry" 2>/dev/null; do
        entry=$((entry + 1))
    done
}

# without_room STATUS FILES COMMAND...: below so many files there is room for none.
without_room() {
    expected=$1
    files=$2
    shift 2
    for folder in $FOLDERS; do
        fill_up "$folder"
    done
    PATH=$AWAKE:$PATH "$@" >/dev/null 2>&1
    ended=$?
    refused=
    for folder in $FOLDERS; do
        cp /appliance/recovery.md "$folder/more" 2>/dev/null || refused="$refused $folder"
        umount -l "$folder"
    done
    [ "$ended" = "$expected" ] && [ "$refused" = " $FOLDERS" ] && return
    echo "status $ended, no room in$refused"
    return 1
}

slow_resync
bays 0xf
stand_in

with_volume
check 'destroy' without_room 0 8 arrayctl destroy 2
check 'it runs' array_is 2 raid5 1.2 sda3 sdb3 sdc3 sdd3
check_volume
# From now on devices go, and udev has to find in /run what it knows of them.
! has_udev || FOLDERS='/tmp /var/log /etc/lvm'
check 'again' without_room 0 1000 arrayctl destroy 2
check 'gone' comes array_left_nothing 2
check 'no superblock' have_no_superblock sda3 sdb3 sdc3 sdd3
check_no_group vg1
verdict 'no room for destroy'

with_data "$WHOLE_8"
check 'initsys' without_room 0 8 arrayctl initsys
check_whole "$WHOLE_8"
verdict 'no room for initsys'

with_partitions "$WHOLE_8"
check 'newvol' without_room 0 8 arrayctl newvol
check 'the array' array_is 2 raid5 1.2 sda3 sdb3 sdc3 sdd3
stop_arrays 2
verdict 'no room for newvol'
finish
