#!/bin/sh
# SPDX-License-Identifier: MIT
# Arrays under LVM go with all that lies on them; the neighbour's groups stay. The second boot looks
# for what is left of the first.
# disks: 4
# size: 72M
# boots: 2
# shellcheck disable=SC2046,SC2086  # lists of words
# shellcheck source=SCRIPTDIR/../lib.sh
. /appliance/lib.sh

NEIGHBOURS='sda6 sdb6 sda1 sdb1 sdc1 sdd1 sda2 sdb2 sdc2 sdd2'
GONE='sda3 sdb3 sdc3 sdb5 sdc5 sdd5 sdc6 sdd6'

neighbour_holds() {
    [ "$(cat /data/file)" = 'the neighbour keeps this' ]
}

# check_rows MD ROW...
check_rows() {
    rows_of "$1" >"$SEEN"
    shift
    printf '  %s\n' "$@" >"$EXPECTED"
    check 'rows' as_expected "$SEEN"
}

# check_no_volumes GROUP MD
check_no_volumes() {
    check 'no physical volume' is_not rows_of "$2"
    check_no_group "$1"
}

if [ "$1" = 1 ]; then
    plan 5
    partition_disks '4M 4M 24M ,E 24M' sda sdb sdc sdd
    array 2 '-l 5' sda3 sdb3 sdc3
    make_group whole 2
    make_volume whole data 100%FREE
    array 3 '-l 5' sdb5 sdc5 sdd5
    make_group room 3
    make_volume room first 2
    make_volume room second 2
    array 4 '-l 1' sda6 sdb6
    make_group neighbour 4
    make_volume neighbour data 1
    for volume in whole/data room/first room/second neighbour/data; do
        must mkfs.ext4 -q "/dev/$volume"
    done
    array 5 '-l 1' sdc6 sdd6
    must pvcreate -q /dev/md5

    # Read-only, so that nothing changes by itself.
    must mkdir -p /data
    must mount /dev/neighbour/data /data
    echo 'the neighbour keeps this' >/data/file
    must umount /data
    must mount -o ro,noload /dev/neighbour/data /data

    settle 4
    picture $NEIGHBOURS >/tmp/others

    check_rows 2 /dev/md2:whole:data:
    destroys full 2 '' sda3 sdb3 sdc3
    check_no_volumes whole 2
    verdict 'RAID 5 under a group with one volume'

    # The row of the free space comes last and names no volume, so it is the group that takes the
    # volumes along.
    check_rows 3 /dev/md3:room:first: /dev/md3:room:second: /dev/md3:room::
    destroys room 3 '/sbin/lvremove -f /dev/room/' sdb5 sdc5 sdd5
    check_no_volumes room 3
    verdict 'RAID 5 under a group with two volumes and free space'

    # Neither group nor volume have a name, and no name must not mean all of them.
    check_rows 5 /dev/md5:::
    destroys alone 5 '/sbin/lvremove -f /dev//
/sbin/vgremove -f /dev/' sdc6 sdd6
    check 'no physical volume' is_not rows_of 5
    verdict 'a mirror under a physical volume without a group'

    picture $NEIGHBOURS >"$SEEN"
    check 'the same to the bit' cmp /tmp/others "$SEEN"
    check 'its file' neighbour_holds
    check 'mounted' grep -q '^/dev/[^ ]* /data ext4 ro' /proc/mounts
    check 'arrays' test "$(arrays_known)" = 4
    verdict 'the neighbour with its group, its mount and its data, and partitions 1 and 2'

    array 2 '-l 5' sda3 sdb3 sdc3
    check 'no signature' has_no_signature md2
    check 'nothing to wipe' test -z "$(wipefs --noheadings /dev/md2)"
    check 'no physical volume' is_not rows_of 2
    check 'no group' is_not vgs whole
    verdict 'the array built anew of the same members shows nothing of LVM'
    drop_arrays 2

    must umount /data
    must vgchange -q -an neighbour
else
    plan 3
    mdadm --assemble --scan >/dev/null 2>&1
    check 'by a scan' test "$(arrays_known)" = 4
    check 'full' is_not mdadm --assemble --run --force /dev/md2 $(nodes sda3 sdb3 sdc3)
    check 'room' is_not mdadm --assemble --run --force /dev/md3 $(nodes sdb5 sdc5 sdd5)
    check 'alone' is_not mdadm --assemble --run --force /dev/md5 $(nodes sdc6 sdd6)
    check 'no other' test "$(arrays_known)" = 4
    verdict 'only the neighbour assembles'

    check 'superblocks' have_no_superblock $GONE
    check 'signatures' has_no_signature $GONE
    check 'groups' test "$(vgs --noheadings -o vg_name | xargs)" = neighbour
    check 'physical volumes' test "$(pvs --noheadings -o pv_name | xargs)" = /dev/md4
    verdict 'no trace of the others on the disks'

    must vgchange -q -ay neighbour
    must dmsetup mknodes
    must mkdir -p /data
    check 'mounts' mount -o ro /dev/neighbour/data /data
    check 'its file' neighbour_holds
    verdict 'the neighbour has its data'
fi
finish
