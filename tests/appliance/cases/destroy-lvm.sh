#!/bin/sh
# SPDX-License-Identifier: MIT
# Arrays under LVM go with all that lies on them; the neighbour's groups stay. The second boot looks
# for what is left of the first.
# disks: 4
# size: 72M
# boots: 2
# shellcheck source=SCRIPTDIR/../lib.sh
. /appliance/lib.sh

FULL_UUID=22222222:aaaaaaaa:bbbbbbbb:dddddddd
ROOM_UUID=33333333:aaaaaaaa:bbbbbbbb:dddddddd
NEIGHBOUR_UUID=44444444:aaaaaaaa:bbbbbbbb:dddddddd
NO_GROUP_UUID=55555555:aaaaaaaa:bbbbbbbb:dddddddd

SYSTEM_PARTITIONS='sda1 sdb1 sdc1 sdd1 sda2 sdb2 sdc2 sdd2'

# make_group GROUP MD
make_group() {
    must pvcreate -q "/dev/md$2"
    must vgcreate -q "$1" "/dev/md$2"
}

# make_volume GROUP VOLUME EXTENTS: without udev nobody else makes its node.
make_volume() {
    must lvcreate -q -y -l "$3" -n "$2" "$1"
    must dmsetup mknodes
    must mkfs.ext4 -q "/dev/$1/$2"
}

make_stacks() {
    make_array 2 --uuid="$FULL_UUID" --level=5 --raid-devices=3 --assume-clean \
        /dev/sda3 /dev/sdb3 /dev/sdc3
    make_group whole 2
    make_volume whole data 100%FREE
    make_array 3 --uuid="$ROOM_UUID" --level=5 --raid-devices=3 --assume-clean \
        /dev/sdb5 /dev/sdc5 /dev/sdd5
    make_group room 3
    make_volume room first 2
    make_volume room second 2
    make_array 4 --uuid="$NEIGHBOUR_UUID" --level=1 --raid-devices=2 --assume-clean \
        /dev/sda6 /dev/sdb6
    make_group neighbour 4
    make_volume neighbour data 1
    make_array 5 --uuid="$NO_GROUP_UUID" --level=1 --raid-devices=2 --assume-clean \
        /dev/sdc6 /dev/sdd6
    must pvcreate -q /dev/md5
}

# Read-only, so that nothing changes by itself.
mount_neighbour() {
    must mkdir -p /data
    must mount /dev/neighbour/data /data
    echo 'the neighbour keeps this' >/data/file
    must umount /data
    must mount -o ro,noload /dev/neighbour/data /data
}

neighbour_holds() {
    [ "$(cat /data/file)" = 'the neighbour keeps this' ]
}

rows_of() {
    pvs -o pv_name,vg_name,lv_name,origin --noheading --separator : | grep "/dev/md$1:"
}

# What pvs says decides what the tool does.
check_rows() {
    rows_of "$1" >"$SEEN"
    check "rows of md$1" as_expected "$SEEN"
}

# group_is_gone GROUP MD
group_is_gone() {
    check 'no physical volume' is_not rows_of "$2"
    check 'no group' is_not vgs "$1"
    check 'no mapped volume' is_not sh -c "dmsetup ls | grep '^$1-'"
    check 'no node of the volume' test ! -e "/dev/mapper/$1-data"
    check 'no folder of the group' test ! -e "/dev/$1"
}

# destroys TAG MD: what the LVM tools say on standard error is theirs; that they ran is not.
destroys() {
    rm -f /var/log/space_operation_error.log
    run_destroy "$1" "$2"
    check_silent_success "$1"
}

commands_that_complained() {
    operation_errors | sed 's/ Error=".*"$//'
}

check_complaints() {
    commands_that_complained >"$SEEN"
    check 'operation error log' as_expected "$SEEN"
}

a_full_group() {
    echo '  /dev/md2:whole:data:' >"$EXPECTED"
    check_rows 2
    destroys full 2
    log_of_removal 2 sda3 sdb3 sdc3 >"$EXPECTED"
    check_log_of_members full 3
    echo 'command="/sbin/mdadm -S /dev/md2"' >"$EXPECTED"
    check_complaints
    group_is_gone whole 2
    check_left_nothing 2 "$FULL_UUID" sda3 sdb3 sdc3
    verdict 'RAID 5 under a group with one volume'
}

# The row of the free space comes last and names no volume, so it is the group that takes the
# volumes along.
a_group_with_room() {
    cat >"$EXPECTED" <<'ROWS'
  /dev/md3:room:first:
  /dev/md3:room:second:
  /dev/md3:room::
ROWS
    check_rows 3
    destroys room 3
    {
        echo 'err Failed to /sbin/lvremove -f /dev/room/'
        log_of_removal 3 sdb5 sdc5 sdd5
    } >"$EXPECTED"
    check_log_of_members room 3
    cat >"$EXPECTED" <<'COMMANDS'
command="/sbin/lvremove -f /dev/room/"
command="/sbin/mdadm -S /dev/md3"
COMMANDS
    check_complaints
    group_is_gone room 3
    check_left_nothing 3 "$ROOM_UUID" sdb5 sdc5 sdd5
    verdict 'RAID 5 under a group with two volumes and free space'
}

# Neither group nor volume have a name, and no name must not mean all of them.
a_physical_volume_alone() {
    echo '  /dev/md5:::' >"$EXPECTED"
    check_rows 5
    destroys alone 5
    {
        echo 'err Failed to /sbin/lvremove -f /dev//'
        echo 'err Failed to /sbin/vgremove -f /dev/'
        log_of_removal 5 sdc6 sdd6
    } >"$EXPECTED"
    check_log_of_members alone 2
    cat >"$EXPECTED" <<'COMMANDS'
command="/sbin/lvremove -f /dev//"
command="/sbin/vgremove -f /dev/"
command="/sbin/mdadm -S /dev/md5"
COMMANDS
    check_complaints
    check 'no physical volume' is_not rows_of 5
    check_left_nothing 5 "$NO_GROUP_UUID" sdc6 sdd6
    verdict 'a mirror under a physical volume without a group'
}

built_anew() {
    make_array 2 --uuid="$FULL_UUID" --level=5 --raid-devices=3 --assume-clean \
        /dev/sda3 /dev/sdb3 /dev/sdc3
    check 'no signature' has_no_signature md2
    check 'nothing to wipe' test -z "$(wipefs --noheadings /dev/md2)"
    check 'no physical volume' is_not rows_of 2
    check 'no group' is_not vgs whole
    verdict 'the array built anew of the same members shows nothing of LVM'
    drop_array 2 /dev/sda3 /dev/sdb3 /dev/sdc3
}

boot_1() {
    plan 5
    partition_disks '4M 4M 24M ,E 24M' sda sdb sdc sdd
    make_stacks
    mount_neighbour
    settle 4
    # shellcheck disable=SC2086  # a list of words
    picture sda6 sdb6 $SYSTEM_PARTITIONS >/tmp/others

    a_full_group
    a_group_with_room
    a_physical_volume_alone

    # shellcheck disable=SC2086
    picture sda6 sdb6 $SYSTEM_PARTITIONS >"$SEEN"
    check 'the same to the bit' cmp /tmp/others "$SEEN"
    check 'its file' neighbour_holds
    check 'mounted' grep -q '^/dev/[^ ]* /data ext4 ro' /proc/mounts
    check 'arrays' test "$(arrays_known)" = 4
    verdict 'the neighbour with its group, its mount and its data, and partitions 1 and 2'

    built_anew
    must umount /data
    must vgchange -q -an neighbour
}

boot_2() {
    plan 3
    mdadm --assemble --scan >/dev/null 2>&1
    check 'by a scan' test "$(arrays_known)" = 4
    check 'full' is_not mdadm --assemble --run --force /dev/md2 /dev/sda3 /dev/sdb3 /dev/sdc3
    check 'room' is_not mdadm --assemble --run --force /dev/md3 /dev/sdb5 /dev/sdc5 /dev/sdd5
    check 'alone' is_not mdadm --assemble --run --force /dev/md5 /dev/sdc6 /dev/sdd6
    check 'no other' test "$(arrays_known)" = 4
    verdict 'only the neighbour assembles'

    check 'superblocks' have_no_superblock sda3 sdb3 sdc3 sdb5 sdc5 sdd5 sdc6 sdd6
    check 'signatures' has_no_signature sda3 sdb3 sdc3 sdb5 sdc5 sdd5 sdc6 sdd6
    check 'groups' test "$(vgs --noheadings -o vg_name | xargs)" = neighbour
    check 'physical volumes' test "$(pvs --noheadings -o pv_name | xargs)" = /dev/md4
    verdict 'no trace of the others on the disks'

    must vgchange -q -ay neighbour
    must dmsetup mknodes
    must mkdir -p /data
    check 'mounts' mount -o ro /dev/neighbour/data /data
    check 'its file' neighbour_holds
    verdict 'the neighbour has its data'
}

"boot_$1"
finish
