#!/bin/sh
# SPDX-License-Identifier: MIT
# What the field notes warn of, as it happens: a case fails when such a fact is none any more.
# disks: 8
# size: 4672M
# shellcheck disable=SC2046,SC2086,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-setup.sh
. /appliance/lib-setup.sh
plan 10

# not_asked TAG MD ROLE MEMBER...: the first of these is asked for the UUID and cannot be read, so nothing
# is wiped.
not_asked() {
    run_destroy "$1" "$2"
    check 'the array has gone' comes array_left_nothing "$2"
    log_of "$1" >/tmp/log
    check 'why' grep -qxF "err bad device order format: '$3'." /tmp/log
    check 'so' grep -q "^err Disk \[/dev/$4\] in RAID \[/dev/md$2\] has no RAID superblock, ret=-1\$" /tmp/log
    md=$2
    shift 3
    check 'all superblocks are left' carry "$md" "$@"
    must mdadm --zero-superblock $(nodes "$@")
}

partition_disks '4M 4M 24M ,E 24M 24M' sda sdb sdc sdd

# A stock Linux numbers arrays from 127 down, and /dev/md1 and /dev/md12 are in "/dev/md127".
array 127 '-l 1' sda3 sdb3
array 1 '-e 0.9 -l 1' sda2 sdb2
must pvcreate -q /dev/md127
for number in 12 1; do
    must vgcreate -q stock /dev/md127
    make_volume stock data 1
    run_destroy "stock$number" "$number"
    check_no_group stock
    check 'its array runs' array_is_clean 127
done
check_output stock12 'Not found /dev/md12 \n'
verdict 'destroy 12 without such an array, and destroy 1, remove the group on md127'
drop_arrays 127

array 2 '-l 1' sda5 sdb5
array 20 '-l 1' sda6 sdb6
make_group two 2
make_group twenty 20
make_volume two data 1
make_volume twenty data 1
run_destroy two 2
check_no_group twenty
check 'the one that was meant is still there' rows_of 2
check 'its array' array_is_clean 2
check 'the other array' array_is_clean 20
verdict 'destroy 2 removes the group of md20 and leaves md2 as it is'
must vgremove -q -f two
must pvremove -q /dev/md2 /dev/md20
drop_arrays 2 20

array 3 '-l 5 --write-journal /dev/sdd3' sda3 sdb3 sdc3
not_asked journal 3 Journal sdd3 sda3 sdb3 sdc3
verdict 'a journal that is asked for the UUID: no superblock is wiped'

array 4 '-l 5 --write-journal /dev/sda3' sdb3 sdc3 sdd3
run_destroy survivor 4
check 'the array has gone' comes array_left_nothing 4
check 'the journal is left' carry 4 sda3
check 'the others are not' have_no_superblock sdb3 sdc3 sdd3
must mdadm --zero-superblock /dev/sda3
verdict 'a journal that is not asked: its superblock alone survives'

slow_resync
make_array 5 --uuid="$(uuid 5)" --assume-clean -l 1 -n 2 -x 1 /dev/sda6 /dev/sdb6 /dev/sdc6
must mdadm /dev/md5 --replace /dev/sda6 --with /dev/sdc6
await sh -c 'mdadm -E /dev/sdc6 | grep "Device Role : Replacement device 0"'
not_asked replacement 5 'Replacement device 0' sdc6 sda6 sdb6
verdict 'a replacement that is asked for the UUID: no superblock is wiped'

# A disk of an older layout is left alone for its data array; for its journal it is not.
bays 0x10
lay_out sde "$WHOLE_6"
array 6 '-l 5 --write-journal /dev/sde3' sda5 sdb5 sdc5
check 'to be formatted' enum_says 1 '5 '
drop_arrays 6
array 6 '-l 5' sda5 sdb5 sde3
check 'not to be formatted' enum_says 0 ''
drop_arrays 6

verdict 'a disk of an older layout that has the journal of an array counts as free'

# A loop device for NVMe and MMC, whose names have no "sd" either.
must modprobe loop max_part=8
must dd if=/dev/zero of=/tmp/disk bs=1M seek=64 count=0
must losetup /dev/loop0 /tmp/disk
lay_out loop0 '3 2048 126976 fd'
await test -b /dev/loop0p3
array 8 '-l 1' loop0p3 sda5
run_destroy loop 8
check 'the array has gone' comes array_left_nothing 8
check 'its superblock is left' carry 8 loop0p3
check 'the other is not' have_no_superblock sda5
verdict 'the superblock on a disk that is not named sd survives'

bays 0x60
array 7 '-l 1' sdf sdg
check 'they look blank' enum_says 2 '6 7 '
check 'a running one keeps them' says 1 '' arrayctl_awake initsys
stop_arrays 7
check 'initsys' says 0 '' arrayctl_awake initsys
check 'sdf' table_is sdf "$LAYOUT_8"
check 'sdg' table_is sdg "$LAYOUT_8"
stop_arrays 0 1
check 'the array has gone' is_not mdadm --assemble --run --force /dev/md7 /dev/sdf /dev/sdg
verdict 'members that are whole disks are wiped by initsys'

for value in "supportraid='yes'" 'supportraid="yes" # note' 'export supportraid=yes'; do
    bays 0x40
    sed -i '/^supportraid=/d' "$CONFIGURATION"
    echo "$value" >>"$CONFIGURATION"
    check "$value" says 0 '' arrayctl_awake initsys
    check 'no RAID support' table_is sdg '1 2048 4980480 83' '2 4982528 4194304 82'
    stop_arrays 0 1
done
verdict "'yes', a note behind it and export mean no"

# Its first line is about the disk; the fourth word of it is no number.
bays 0xc0
check 'it is accepted' sfdisk.stock -l -uS -N3 /dev/sdh
check 'no size' [ "$(sfdisk.stock -l -uS -N3 /dev/sdh | awk 'NR == 1 { print $4 + 0 }')" = 0 ]
check 'a blank disk' enum_says 1 '8 '
mv /usr/sbin/sfdisk /usr/sbin/sfdisk.whole
ln -s sfdisk.stock /usr/sbin/sfdisk
check 'is none any more' enum_says 0 ''
mv /usr/sbin/sfdisk.whole /usr/sbin/sfdisk
verdict 'to the stock partitioner no disk is blank'

finish
