#!/bin/sh
# SPDX-License-Identifier: MIT
# Arrays that go and do not come back, while others on the same disks stay. The second boot looks
# for what is left of the first.
# disks: 4
# size: 44M
# boots: 2
# shellcheck disable=SC2046,SC2086  # lists of words
# shellcheck source=SCRIPTDIR/../lib.sh
. /appliance/lib.sh

OTHERS='sda7 sdb7 sdc7 sdd7'
SYSTEM_PARTITIONS='sda1 sdb1 sdc1 sdd1 sda2 sdb2 sdc2 sdd2'
MEMBERS='sda3 sdb3 sdc3 sdd3 sda5 sdb5 sdc5 sdd5 sda6 sdb6 sdc6 sdd6'

# comes_back MD MEMBER...: whichever way it is asked for.
comes_back() {
    number=$1
    shift
    mdadm --assemble --run "/dev/md$number" --uuid="$(uuid "$number")" ||
        mdadm --assemble --run --force "/dev/md$number" $(nodes "$@") || is_not array_is_gone "$number"
}

if [ "$1" = 1 ]; then
    plan 9
    partition_disks '4M 4M 8M ,E 8M 8M' sda sdb sdc sdd
    # The appliance's own arrays have room for a fourth disk.
    array 0 '-e 0.9 -l 1' sda1 sdb1 sdc1 missing
    array 1 '-e 0.9 -l 1' sda2 sdb2 sdc2 missing
    array 9 '-l 5' $OTHERS
    array 2 '-l 1' sda3 sdb3
    array 3 '-l 5' sda5 sdb5 sdc5
    array 4 '-l 5' sda6 sdb6 sdc6
    fail_member 4 sdb6
    must mdadm /dev/md4 --remove /dev/sdb6
    slow_resync
    make_array 5 -e 0.90 --uuid="$(uuid 5)" -l 1 -n 2 /dev/sdc3 /dev/sdd3
    for number in 0 1 9 2 3 4; do
        fill "md$number"
    done
    settle 0 1 9

    picture $OTHERS >/tmp/others

    destroys mirror 2 '' sda3 sdb3
    verdict 'a mirror'

    # Partitions 1 and 2 of the fourth disk carry the superblock of an array that goes.
    for copy in sdd1 sdd2; do
        must dd if=/dev/sda5 of="/dev/$copy" bs=4k count=2
        must blockdev --flushbufs "/dev/$copy"
    done

    picture $SYSTEM_PARTITIONS >/tmp/system
    wipes raid5 3 '' sda5 sdb5 sdc5
    check 'partitions 1 and 2 have its superblock' carry 3 sdd1 sdd2
    picture $SYSTEM_PARTITIONS >"$SEEN"
    check 'the same to the bit' cmp /tmp/system "$SEEN"
    verdict 'partitions 1 and 2 are left alone even with a superblock of the array'
    must mdadm --zero-superblock /dev/sdd1 /dev/sdd2
    left_nothing 3 sda5 sdb5 sdc5
    verdict 'RAID 5'

    check 'degraded' test "$(cat /sys/block/md4/md/degraded)" = 1
    destroys degraded 4 '' sda6 sdb6 sdc6
    verdict 'degraded RAID 5, and the member that it lost'

    check 'resyncs' test "$(cat /sys/block/md5/md/sync_action)" = resync
    destroys resync 5 '' sdc3 sdd3
    verdict 'a mirror that resyncs'

    array 6 '-l 1' sdd5 sdd6
    echo ,1M >/tmp/table
    must sh -c 'sfdisk.stock -q /dev/md6 </tmp/table'
    await test -b /dev/md6p1
    destroys table 6 '' sdd5 sdd6
    check 'no partition of it' is_not grep -q md6 /proc/partitions
    verdict 'an array with a partition table of its own'

    # Only superblocks are wiped: whoever builds on the same members again finds the old content.
    array 6 '-l 1' sdd5 sdd6
    check 'the table is back' test "$(blkid -p -s PTTYPE -o value /dev/md6)" = dos
    verdict 'what was written right on the array is not wiped'
    drop_arrays 6

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
else
    plan 3
    # A scan would take the system arrays, which name no host, for another machine's.
    check 'comes back' mdadm --assemble --run /dev/md0 --uuid="$(uuid 0)"
    check 'comes back' mdadm --assemble --run /dev/md1 --uuid="$(uuid 1)"
    mdadm --assemble --scan >/dev/null 2>&1
    for number in 0 1 9; do
        check 'its data' holds "md$number"
    done
    verdict 'the other arrays come back with their data'

    check 'by a scan' test "$(arrays_known)" = '0 1 9'
    check 'mirror' is_not comes_back 2 sda3 sdb3
    check 'RAID 5' is_not comes_back 3 sda5 sdb5 sdc5
    check 'degraded' is_not comes_back 4 sda6 sdb6 sdc6
    check 'resyncing' is_not comes_back 5 sdc3 sdd3
    check 'with a table' is_not comes_back 6 sdd5 sdd6
    check 'no other' test "$(arrays_known)" = '0 1 9'
    verdict 'none of those that went assembles again'

    for number in 2 3 4 5 6; do
        check 'superblocks' uuid_is_nowhere "$(uuid "$number")"
    done
    check 'superblocks' have_no_superblock $MEMBERS
    check 'signatures' has_no_signature $MEMBERS
    verdict 'no trace of them on the disks'
fi
finish
