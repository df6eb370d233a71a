#!/bin/sh
# SPDX-License-Identifier: MIT
# The host reads every sector of disks of full size before and behind each command's rehearsal.
# disks: 4
# size: 4672M
# alone: yes
# pictures: yes
# shellcheck disable=SC2086  # lists of words
# shellcheck source=SCRIPTDIR/../lib-rehearse.sh
. /appliance/lib-rehearse.sh
plan 5
record_calls
watched='sda sdb sdc sdd'
slow_resync

# each_command INITSYS INITSYS-DD NEWVOL DESTROY STATUS ENUM ENUM-DUAL: their statuses.
each_command() {
    check 'initsys' keeps_every_sector "$1" initsys
    check 'initsys-dd' keeps_every_sector "$2" initsys-dd
    check 'newvol' keeps_every_sector "$3" newvol
    check 'destroy 2' keeps_every_sector "$4" destroy 2
    check 'status 2' keeps_every_sector "$5" status 2
    check 'enumformatalldisks' keeps_every_sector "$6" enumformatalldisks
    check 'the other enumeration' keeps_every_sector "$7" enumformatalldisks_indualhead_install
}

# answers_alike COMMAND...: what asks is told with what it prints, and with its status.
answers_alike() {
    arrayctl "$@" >/tmp/report
    answered=$?
    {
        sed 's/^/  /' /tmp/report
        [ -s /tmp/report ] || echo '  nothing'
        echo "Its exit status: $answered"
    } >"$EXPECTED"
    arrayctl-rehearse "$@" >"$TOLD" 2>/tmp/told.errors
    sed -n -e '/^What it prints:/,/^What it logs:/p' -e '/^Its exit status/p' "$TOLD" |
        sed -e '/^What it/d' -e '/^$/d' >"$SEEN"
    as_expected "$SEEN"
}

# Data of four kinds, none of it the appliance's newest.
lay_out sda "$WHOLE_6"
lay_out sdb "$WHOLE_7"
array 2 '-l 1 -e 1.2' sda3 sdb3
store_data md2
must mkfs.ext4 -q -F -E lazy_itable_init=0,lazy_journal_init=0 -L films /dev/sdc
must mkdir -p /films
must mount /dev/sdc /films
pattern sdc >/films/file
partition_disks '64M 64M' sdd
fill sdd1
must mkswap /dev/sdd2
settle 2
each_command 3 3 3 0 0 0 0
verdict 'older layouts, a foreign file system that is mounted'

must umount /films
stop_arrays 2
for disk in sda sdb sdc sdd; do
    must wipefs -q -a /dev/$disk
    read_table_again "$disk"
done
check 'initsys' says 0 '' arrayctl_awake initsys
check 'newvol' says 0 'Creating RAID 5 volume... \n' arrayctl_awake newvol
verdict 'a real installation'

for number in 0 1 2; do
    echo frozen >"/sys/block/md$number/md/sync_action"
    [ "$number" = 2 ] || echo none >"/sys/block/md$number/md/resync_start"
done
make_group vg1 2
make_volume vg1 volume_1 100%FREE
must mkfs.ext4 -q -E lazy_itable_init=0,lazy_journal_init=0 -L films /dev/vg1/volume_1
must mount /dev/vg1/volume_1 /films
pattern volume >/films/file
settle 0 1 2
each_command 3 3 3 3 0 0 0
check 'status' answers_alike status 2
check 'enumeration' answers_alike enumformatalldisks
check 'the other one' answers_alike enumformatalldisks_indualhead_install
verdict 'arrays that run, and a volume that is mounted'

must umount /films
must lvm vgchange -q -a n
stop_arrays 0 1 2
each_command 0 0 0 3 0 0 0
check 'status' answers_alike status 2
check 'enumeration' answers_alike enumformatalldisks
verdict 'arrays that are not assembled'

host_picture >/tmp/picture
printf x | dd of=/dev/sdc bs=1 seek=4898947071 conv=notrunc 2>/dev/null
host_picture >/tmp/picture.now
diff /tmp/picture /tmp/picture.now | sed -n 's/^[-+]\(disk[^ ]*\) .*/\1/p' >"$SEEN"
printf '%s\n' disk2.raw disk2.raw >"$EXPECTED"
check 'one byte' as_expected "$SEEN"
verdict 'the last byte of a disk changes its line'
finish
