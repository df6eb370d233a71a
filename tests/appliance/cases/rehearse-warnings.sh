#!/bin/sh
# SPDX-License-Identifier: MIT
# Each thing that should make a person stop before the real run, on real disks.
# disks: 4
# size: 4672M
# shellcheck disable=SC2046,SC2086,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-rehearse.sh
. /appliance/lib-rehearse.sh
plan 18
REFUSED='the programs will refuse to change it, and the real run will end otherwise than this rehearsal'

must mkfs.ext4 -q -F -L films /dev/sdd
check 'a foreign disk' warns initsys \
    '/dev/sdd carries a signature that is not the appliance'"'"'s: ext4 "films"' 'ext4 "films" on /dev/sdd, 4.5 GiB'
check 'what becomes of it' grep -q '^  /dev/sdd .* holds ext4 "films"  -> WIPED$' "$TOLD"
verdict 'a foreign signature'

must mount /dev/sdd /mnt
check 'it is mounted' warns initsys 'ext4 "films" on /dev/sdd, 4.5 GiB is mounted at /mnt' \
    "/dev/sdd is in use (mounted at /mnt): $REFUSED"
must umount /mnt
verdict 'a mounted file system'

must blockdev --setro /dev/sdd
check 'it is read-only' warns initsys \
    '/dev/sdd is read-only: the command fails at it, after others have been changed'
must blockdev --setrw /dev/sdd
must wipefs -q -a /dev/sdd
verdict 'a disk that cannot be written to'

bays 0x7
check 'three bays' warns initsys 'the command does not look at /dev/sdd'
sed -i /maxdisks/d "$CONFIGURATION"
check 'no number of slots' warns initsys
check 'why' grep -q 'no disk has a slot, look at maxdisks and max_sys_raid_disks: .*maxdisks)' "$TOLD"
verdict 'a disk outside the bays, and a machine without slots'

bays 0xf
touch /.force_clean_all_disk /tmp/raid.0 /tmp/.dualhead
check 'markers' warns 'status 2' 'the marker /.force_clean_all_disk is set: every disk is wiped' \
    'the marker /tmp/raid.0 is set: newvol makes a RAID 0' \
    'the marker /tmp/.dualhead contradicts support_dual_head in /etc.defaults/nuroinfo.conf'
rm /.force_clean_all_disk /tmp/raid.0 /tmp/.dualhead
verdict 'markers'

mkfifo /tmp/held
printf '#!/bin/sh\nread -r line </tmp/held\n' >/tmp/arrayctl
chmod +x /tmp/arrayctl
/tmp/arrayctl &
check 'two at once' warns 'status 2' "arrayctl runs at this moment, as process $!"
echo go >/tmp/held
wait
verdict 'another run'

for disk in sda sdb sdc sdd; do
    lay_out $disk "$WHOLE_8"
done
array 0 '-e 0.9 -l 1' sda1 sdb1 sdc1 sdd1
array 2 '-l 5' sda3 sdb3 sdc3
settle 0 2
check 'a system that runs' warns initsys "/dev/sda1 is in use (held by md0): $REFUSED"
drop_arrays 0
verdict 'partitions in use'

must mkswap /dev/sdb2
must swapon /dev/sdb2
check 'swap' warns initsys "/dev/sdb2 is in use (used as swap): $REFUSED"
must swapoff /dev/sdb2
verdict 'swap in use'

must blockdev --setro /dev/sdd
check 'newvol' warns newvol \
    '/dev/sdd is read-only: the command fails at it, after others have been changed'
must blockdev --setrw /dev/sdd
verdict 'a new volume that fails half-way'

must mv /usr/sbin/sfdisk /usr/sbin/sfdisk.whole
printf '#!/bin/sh\ncase $* in *-l*sdd) exit 4 ;; esac\nexec /usr/sbin/sfdisk.whole "$@"\n' >/usr/sbin/sfdisk
chmod +x /usr/sbin/sfdisk
check 'a listing' warns enumformatalldisks \
    'a listing failed, and may be taken for an empty one: /sbin/sfdisk -l -uS -N1 /dev/sdd (status 4)'
must mv /usr/sbin/sfdisk.whole /usr/sbin/sfdisk
verdict 'a listing that fails'

array 20 '-l 1 -e 1.2' sdd1 sdd2
array 21 '-l 1 -e 1.2 --force' sdd3
must pvcreate -q /dev/md2 /dev/md20 /dev/md21
must vgcreate -q two /dev/md2
must vgcreate -q twenty /dev/md20 /dev/md21
make_volume twenty data 1
check 'another row' warns 'destroy 2' 'the group twenty lies on more than one device: /dev/md20, /dev/md21'
check 'its words' grep -q 'pvs has a row that contains /dev/md2 without being it: "/dev/md20:twenty:data:"' "$TOLD"
must vgremove -q -f twenty two
must pvremove -q /dev/md2 /dev/md20 /dev/md21
drop_arrays 20 21
verdict 'the wrong group, and one on two devices'

fail_member 2 sdc3
check 'a member less' warns 'destroy 2' 'the array md2 lacks 1 of its members: their superblocks stay'
stop_arrays 2
check 'stopped' warns 'destroy 2' \
    'the array md2 is not assembled, so it is not found; its superblocks stay on sda3, sdb3, sdc3: recovery.md, rows 11 to 13'
verdict 'an array that is not whole'

must mdadm --zero-superblock /dev/sda3 /dev/sdb3 /dev/sdc3
array 2 '-l 5 --write-journal /dev/sdd3' sda3 sdb3 sdc3
check 'a journal' warns 'destroy 2' \
    '/dev/sdd3 is a member that the tool does not read: mdadm -E calls it "Journal"' \
    'the superblock on /dev/sdd3 survives: /dev/md2 is stopped, and can come back'
check 'and in its log' grep -q "the tool could not read a report of mdadm -E: .* bad device order format: 'Journal'" "$TOLD"
stop_arrays 2
must mdadm --zero-superblock /dev/sdd3
verdict 'a journal'

is_replacement() {
    mdadm -E "/dev/$1" | grep -q 'Replacement device 0'
}

slow_resync
array 2 '-l 1' sda3 sdb3
must mdadm /dev/md2 --add /dev/sdc3
echo want_replacement >/sys/block/md2/md/dev-sda3/state
await is_replacement sdc3
check 'a replacement' warns 'destroy 2' \
    '/dev/sdc3 is a member that the tool does not read: mdadm -E calls it "Replacement device 0"' \
    'the superblock on /dev/sdc3 survives: /dev/md2 is stopped, and can come back'
stop_arrays 2
must mdadm --zero-superblock /dev/sda3 /dev/sdb3 /dev/sdc3
array 2 '-l 5' sda3 sdb3 sdc3
stop_arrays 2
verdict 'a replacement'

for disk in sda sdb sdc; do
    must sfdisk.stock -q --delete "/dev/$disk" 1 2
done
check 'cut off' warns initsys \
    '/dev/sda has no partitions 1 and 2 and is taken for blank, but /dev/sda3 carries the superblock of an array: it looks like a run that was cut off: recovery.md, row 1; running again loses the data'
verdict 'a run that was cut off'

for disk in sda sdb sdc sdd; do
    must sh -c "mdadm --zero-superblock /dev/${disk}3; wipefs -q -a /dev/$disk"
    read_table_again "$disk"
done
machine internalportcfg=0x1f usbportcfg=0x10000 maxdisks=5
debug_disk
check 'a small disk' warns initsys "/dev/$disk is too small for partition 1, which begins at sector \
2048: the command fails at it, after others have been changed"
must rmmod scsi_debug
verdict 'a disk that is too small'

debug_disk virtual_gb=6 opts=2 medium_error_start=0
check 'it cannot be read' warns initsys \
    "/dev/$disk cannot be read: the command fails at it, after others have been changed"
must rmmod scsi_debug
bays 0xf
verdict 'a disk that cannot be read'

check 'nothing speaks against it' rehearses 0 initsys
check 'in words' tells 'nothing'
verdict 'none of that'
finish
