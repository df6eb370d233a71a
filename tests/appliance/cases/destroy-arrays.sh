#!/bin/sh
# SPDX-License-Identifier: MIT
# Arrays that go and do not come back, while others on the same disks stay. The second boot looks
# for what is left of the first.
# disks: 4
# size: 44M
# boots: 2
# shellcheck source=SCRIPTDIR/../lib.sh
. /appliance/lib.sh

SYSTEM_UUID=00000000:11111111:22222222:33333333
SWAP_UUID=00000001:11111111:22222222:33333333
MIRROR_UUID=22222222:aaaaaaaa:bbbbbbbb:cccccccc
RAID5_UUID=33333333:aaaaaaaa:bbbbbbbb:cccccccc
DEGRADED_UUID=44444444:aaaaaaaa:bbbbbbbb:cccccccc
RESYNC_UUID=55555555:aaaaaaaa:bbbbbbbb:cccccccc
TABLE_UUID=66666666:aaaaaaaa:bbbbbbbb:cccccccc
# As close to another one as it can be.
OTHER_UUID=33333333:aaaaaaaa:bbbbbbbb:cccccccd

OTHERS='sda7 sdb7 sdc7 sdd7'
SYSTEM_PARTITIONS='sda1 sdb1 sdc1 sdd1 sda2 sdb2 sdc2 sdd2'

# The appliance's own arrays have room for a fourth disk.
make_arrays_that_stay() {
    make_array 0 -e 0.9 --uuid="$SYSTEM_UUID" --level=1 --raid-devices=4 --assume-clean \
        /dev/sda1 /dev/sdb1 /dev/sdc1 missing
    make_array 1 -e 0.9 --uuid="$SWAP_UUID" --level=1 --raid-devices=4 --assume-clean \
        /dev/sda2 /dev/sdb2 /dev/sdc2 missing
    make_array 9 --uuid="$OTHER_UUID" --level=5 --raid-devices=4 --assume-clean \
        /dev/sda7 /dev/sdb7 /dev/sdc7 /dev/sdd7
    fill md0
    fill md1
    fill md9
}

make_arrays_that_go() {
    make_array 2 --uuid="$MIRROR_UUID" --level=1 --raid-devices=2 --assume-clean /dev/sda3 /dev/sdb3
    make_array 3 --uuid="$RAID5_UUID" --level=5 --raid-devices=3 --assume-clean \
        /dev/sda5 /dev/sdb5 /dev/sdc5
    make_array 4 --uuid="$DEGRADED_UUID" --level=5 --raid-devices=3 --assume-clean \
        /dev/sda6 /dev/sdb6 /dev/sdc6
    fail_member 4 sdb6
    must mdadm /dev/md4 --remove /dev/sdb6
    slow_resync
    make_array 5 -e 0.90 --uuid="$RESYNC_UUID" --level=1 --raid-devices=2 /dev/sdc3 /dev/sdd3
    fill md2
    fill md3
    fill md4
}

# Partitions 1 and 2 of the fourth disk carry the superblock of an array that goes.
copy_superblock_to_system_partitions() {
    for copy in sdd1 sdd2; do
        must dd if=/dev/sda5 of="/dev/$copy" bs=4k count=2
        must blockdev --flushbufs "/dev/$copy"
    done
}

# destroys TAG MD UUID MEMBER...: with all that must be seen of it.
destroys() {
    tag=$1
    array=$2
    uuid=$3
    shift 3
    rm -f /var/log/space_operation_error.log
    run_destroy "$tag" "$array"
    check_silent_success "$tag"
    log_of_removal "$array" "$@" >"$EXPECTED"
    check_log_of_members "$tag" $#
    operation_errors >"$SEEN"
    echo "command=\"/sbin/mdadm -S /dev/md$array\" Error=\"mdadm: stopped /dev/md$array \"" \
        >"$EXPECTED"
    check 'operation error log' as_expected "$SEEN"
    check_left_nothing "$array" "$uuid" "$@"
}

carries() {
    mdadm -E "/dev/$1" | grep -q "UUID : $2"
}

an_array_with_a_partition_table() {
    make_array 6 --uuid="$TABLE_UUID" --level=1 --raid-devices=2 --assume-clean /dev/sdd5 /dev/sdd6
    echo ,1M >/tmp/table
    must sh -c 'sfdisk.stock -q /dev/md6 </tmp/table'
    must wait_for "$SETTLE_SECONDS" test -b /dev/md6p1
    destroys table 6 "$TABLE_UUID" sdd5 sdd6
    check 'no partition of it' is_not grep -q md6 /proc/partitions
    verdict 'an array with a partition table of its own'

    # Only superblocks are wiped: whoever builds on the same members again finds the old content.
    make_array 6 --uuid="$TABLE_UUID" --level=1 --raid-devices=2 --assume-clean /dev/sdd5 /dev/sdd6
    check 'the table is back' test "$(blkid -p -s PTTYPE -o value /dev/md6)" = dos
    verdict 'what was written right on the array is not wiped'
    drop_array 6 /dev/sdd5 /dev/sdd6
}

boot_1() {
    plan 9
    partition_disks '4M 4M 8M ,E 8M 8M' sda sdb sdc sdd
    make_arrays_that_stay
    make_arrays_that_go
    settle 0 1 9
    # shellcheck disable=SC2086  # lists of words
    picture $OTHERS >/tmp/others

    destroys mirror 2 "$MIRROR_UUID" sda3 sdb3
    verdict 'a mirror'

    copy_superblock_to_system_partitions
    # shellcheck disable=SC2086
    picture $SYSTEM_PARTITIONS >/tmp/system
    run_destroy raid5 3
    check_silent_success raid5
    log_of_removal 3 sda5 sdb5 sdc5 >"$EXPECTED"
    check_log_of_members raid5 3
    check 'partition 1 has its superblock' carries sdd1 "$RAID5_UUID"
    check 'partition 2 has its superblock' carries sdd2 "$RAID5_UUID"
    # shellcheck disable=SC2086
    picture $SYSTEM_PARTITIONS >"$SEEN"
    check 'the same to the bit' cmp /tmp/system "$SEEN"
    verdict 'partitions 1 and 2 are left alone even with a superblock of the array'
    must mdadm --zero-superblock /dev/sdd1 /dev/sdd2
    check_left_nothing 3 "$RAID5_UUID" sda5 sdb5 sdc5
    verdict 'RAID 5'

    check 'degraded' test "$(cat /sys/block/md4/md/degraded)" = 1
    destroys degraded 4 "$DEGRADED_UUID" sda6 sdb6 sdc6
    verdict 'degraded RAID 5, and the member that it lost'

    check 'resyncs' test "$(cat /sys/block/md5/md/sync_action)" = resync
    destroys resync 5 "$RESYNC_UUID" sdc3 sdd3
    verdict 'a mirror that resyncs'

    an_array_with_a_partition_table

    # shellcheck disable=SC2086
    picture $OTHERS >"$SEEN"
    check 'the same to the bit' cmp /tmp/others "$SEEN"
    for number in 0 1 9; do
        check 'runs' array_is_clean "$number"
        check 'its data' holds "md$number"
    done
    verdict 'the other arrays on the same disks'

    mdadm --assemble --scan >/dev/null 2>&1
    check 'arrays' test "$(arrays_known)" = '0 1 9'
    verdict 'a scan of all disks brings nothing back'
}

# comes_back MD UUID MEMBER...: whichever way it is asked for.
comes_back() {
    number=$1
    uuid=$2
    shift 2
    mdadm --assemble --run "/dev/md$number" --uuid="$uuid" ||
        mdadm --assemble --run --force "/dev/md$number" "$@" || is_not array_is_gone "$number"
}

boot_2() {
    plan 3
    # A scan would take the system arrays, which name no host, for another machine's.
    check 'comes back' mdadm --assemble --run /dev/md0 --uuid="$SYSTEM_UUID"
    check 'comes back' mdadm --assemble --run /dev/md1 --uuid="$SWAP_UUID"
    mdadm --assemble --scan >/dev/null 2>&1
    for number in 0 1 9; do
        check 'its data' holds "md$number"
    done
    verdict 'the other arrays come back with their data'

    check 'by a scan' test "$(arrays_known)" = '0 1 9'
    check 'mirror' is_not comes_back 2 "$MIRROR_UUID" /dev/sda3 /dev/sdb3
    check 'RAID 5' is_not comes_back 3 "$RAID5_UUID" /dev/sda5 /dev/sdb5 /dev/sdc5
    check 'degraded' is_not comes_back 4 "$DEGRADED_UUID" /dev/sda6 /dev/sdb6 /dev/sdc6
    check 'resyncing' is_not comes_back 5 "$RESYNC_UUID" /dev/sdc3 /dev/sdd3
    check 'with a table' is_not comes_back 6 "$TABLE_UUID" /dev/sdd5 /dev/sdd6
    check 'no other' test "$(arrays_known)" = '0 1 9'
    verdict 'none of those that went assembles again'

    for uuid in "$MIRROR_UUID" "$RAID5_UUID" "$DEGRADED_UUID" "$RESYNC_UUID" "$TABLE_UUID"; do
        check 'superblocks' uuid_is_nowhere "$uuid"
    done
    members='sda3 sdb3 sdc3 sdd3 sda5 sdb5 sdc5 sdd5 sda6 sdb6 sdc6 sdd6'
    # shellcheck disable=SC2086
    check 'superblocks' have_no_superblock $members
    # shellcheck disable=SC2086
    check 'signatures' has_no_signature $members
    verdict 'no trace of them on the disks'
}

"boot_$1"
finish
