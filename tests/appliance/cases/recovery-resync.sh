#!/bin/sh
# SPDX-License-Identifier: MIT
# Row 3: layout 8 lies over the data of an older one. What is still there, and what the resync takes.
# alone: yes
# disks: 4
# size: 4672M
# shellcheck disable=SC2046,SC2086,SC2154,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-recovery.sh
. /appliance/lib-recovery.sh
plan 6

# overwrites TABLE LAYOUT8: a second run has laid it over the data.
overwrites() {
    lose_system "$1"
    must arrayctl_awake initsys
    check_tables "$2" $ALL
}

# begins_alike DISK DISK SECTOR: with the same superblock, which tells a member's place.
begins_alike() {
    [ "$(dd if="/dev/$1" bs=512 skip=$(($3 + 8)) count=8 2>/dev/null | md5sum)" = \
        "$(dd if="/dev/$2" bs=512 skip=$(($3 + 8)) count=8 2>/dev/null | md5sum)" ]
}

# is_past MD SECTOR: that much of it has been copied.
is_past() {
    read -r copied _ <"/sys/block/md$1/md/sync_completed"
    [ "$copied" = none ] || [ "$copied" -gt "$2" ]
}

check_refused() { # SECTOR
    check 'the sectors are taken' is_not sh -c "echo 'start=$1' | sfdisk.stock -q --no-reread -N3 /dev/sda"
}

# The 128 KiB around the superblocks of layout 8's system and swap arrays, and which of their sectors are
# others now.
SUPERBLOCKS='4982400 9176704'
mark_superblocks() {
    for sector in $SUPERBLOCKS; do
        head -c 131072 /dev/urandom >"/tmp/mark.$sector"
        must dd if="/tmp/mark.$sector" of=/dev/sda bs=512 seek=$((sector - 64)) conv=notrunc,fsync
    done
}

changed_at() {
    must blockdev --flushbufs /dev/sda
    dd if=/dev/sda bs=512 skip=$(($1 - 64)) count=256 2>/dev/null | cmp -l - "/tmp/mark.$1" |
        awk -v first="$1" '{ print first - 64 + int(($1 - 1) / 512) }' | sort -nu | xargs
}

slow_resync
bays 0xf
stand_in

for kind in '' stock; do
    overwrites "$WHOLE_2" "$LAYOUT_8"
    check_refused 6281415
    check 'swap waits for its resync' grep -q 'resync=DELAYED' /proc/mdstat
    numbers 2 RAID
    way_back 3 $kind
    check_way_back "$WHOLE_2"
done
verdict 'row 3: layout 2, at once'

overwrites "$WHOLE_2" "$LAYOUT_8"
must mdadm -S /dev/md0
at_full_speed 1
await grep -qx resync /sys/block/md1/md/sync_action
await is_past 1 $((6281415 + 65536 - 4982528))
numbers 2 RAID
way_back 3
check 'it is no array any more' is_not array_is 2 raid5 1.2 sda3 sdb3 sdc3 sdd3
for disk in sdb sdc sdd; do
    check 'one is as the other' begins_alike sda "$disk" 6281415
done
forget
verdict 'row 3: layout 2, after the resync'

# Every run wipes that layout, and the second one does not know it any more.
with_data "$WHOLE_1"
must arrayctl_awake initsys
forget
must arrayctl_awake initsys
check_tables "$LAYOUT_8" $ALL
numbers 1 RAID
way_back 3
check_way_back "$WHOLE_1"
verdict 'row 3: layout 1, at once'

ALL='sda sdb'
PLAIN_8=$(plain_of 8 | head -n 2)
bays 0x3 maxdisks=2 supportraid=no
for layout in 1 2 3 5; do
    whole=$(plain_of "$layout")
    overwrites "$whole" "$PLAIN_8"
    numbers "$layout" 'no RAID'
    with_disks
    way_back 3
    check_way_back "$whole"
done
verdict 'row 3: layouts 1, 2, 3 and 5 without RAID, at once'

whole=$(plain_of 3)
rm -r /tmp/kept.*
overwrites "$whole" "$PLAIN_8"
at_full_speed 0
await is_past 0 $((1333332 + 65536 - 2048))
check 'one is as the other' begins_alike sda sdb 1333332
with DISKS=/dev/sda MEMBERS=/dev/sda3
numbers 3 'no RAID'
way_back 3
check_tables "$whole" sda
picture md2 >/tmp/now
check 'every byte' cmp /tmp/before /tmp/now
check 'its files' data_is_whole md2
forget
verdict 'row 3: a mirror, after the resync'

ALL=sda
bays 0x1 supportraid=no
with_data "$whole"
mark_superblocks
cut_at before 'sfdisk -N1 *' 1 '' 0 initsys
forget
must arrayctl_awake initsys
numbers 3 'no RAID'
with_disks
way_back 3
check_way_back "$whole"
for sector in $SUPERBLOCKS; do
    check 'what is lost' [ "$(changed_at "$sector")" = "$(seq "$sector" $((sector + 7)) | xargs)" ]
done
verdict 'row 3: one disk, and what is lost of it'
finish
