#!/bin/sh
# SPDX-License-Identifier: MIT
# Four blank disks become a machine; then the same machine is set up again and again: with its
# arrays running, with data on it, with fewer slots, with one disk, and by force.
# disks: 7
# size: 4672M
# shellcheck disable=SC2086,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-setup.sh
. /appliance/lib-setup.sh
plan 11

INTERNAL='sda sdb sdc sdd'
# Two on USB, one on eSATA.
FOREIGN='sde sdf sdg'

slow_resync

machine internalportcfg=0x0
watch_writes $INTERNAL $FOREIGN
check 'nothing to format' enum_says 0 ''
installs_none
check 'no disk is touched' nothing_written
check 'no array' [ -z "$(arrays_known)" ]
verdict 'no disk in the bays'

machine internalportcfg=0xf esataportcfg=0x40

watch_writes $INTERNAL $FOREIGN
check 'all are to be formatted' enum_says 4 '1 2 3 4 '
check 'the same for a second head' enum_dual_says 4 '1 2 3 4 '
check 'a list changes nothing' nothing_written
verdict 'the numbers of four blank disks'

watch_writes $FOREIGN
check_initsys sda sdb sdc sdd
check 'it waits before both arrays' slept 2 3 "$SLEEPS"
check_tables "$LAYOUT_8" $INTERNAL
check 'a clean label' only_dos sda
check 'two arrays' [ "$(arrays_known)" = '0 1' ]
check 'USB and eSATA disks are left alone' nothing_written
check 'no tool complained' [ ! -e "$OPERATION_ERRORS" ]
verdict 'initsys on four blank disks'
await mdadm_state_is 0 'clean, resyncing'
await mdadm_state_is 1 'clean, resyncing (DELAYED)'
# 2,490,240 and 2,097,152 KiB, less the last whole 64 KiB that an old superblock takes.
report 0 NORMAL 'Progressing...[' 'RAID 1' 2549940224 sdd1 sdc1 sdb1 sda1 >"$EXPECTED"
check 'report' answers 0 arrayctl status 0
verdict 'the system array at its first resync'
report 1 NORMAL 'Waiting...' 'RAID 1' 2147418112 sdd2 sdc2 sdb2 sda2 >"$EXPECTED"
check 'report' answers 0 arrayctl status 1
verdict 'the swap array waits for it'

# The partitions in use cannot go, so no disk gets new ones.
uuids="$(uuid_of 0) $(uuid_of 1)"
check 'current disks need no format' enum_says 0 ''
installs_none $INTERNAL
for disk in $INTERNAL; do
    check 'the driver said no before' \
        logged "debug Failed to do '/sbin/sfdisk --fast-delete 1:2 /dev/$disk'"
done
check_tables "$LAYOUT_8" $INTERNAL
check 'arrays' system_arrays_are sda sdb sdc sdd
check 'the same arrays' [ "$(uuid_of 0) $(uuid_of 1)" = "$uuids" ]
verdict 'initsys while the arrays run'

for disk in sda sdb; do
    must sfdisk -N3 '' -uS -q -f -j260352 -z-1 -tfd -F "/dev/$disk"
done
array 2 '-l 1' sda3 sdb3
store_data md2
must mount -o ro /dev/md2 /mnt
stop_arrays 0 1
check_initsys sda sdb sdc sdd
check 'two pauses' slept 2 3 "$SLEEPS"
check 'how it chose' logged_chose 8
check_tables "$WHOLE_8" sda sdb
check_tables "$LAYOUT_8" sdc sdd
check 'new ones' is_not [ "$(uuid_of 0) $(uuid_of 1)" = "$uuids" ]
check 'the data array runs' array_is 2 raid1 1.2 sda3 sdb3
umount /mnt
check 'data' data_is_whole md2
verdict 'initsys beside a data array that is in use'

stop_arrays 0 1
machine internalportcfg=0xf maxdisks=4 max_sys_raid_disks=2
check 'there is what is to be wiped' [ "$(claims_of /dev/sdc1 /dev/sdd2)" = \
    '0.90.00 raid1 4 0 2 0.90.00 raid1 4 1 3 ' ]
check_initsys sda sdb
stop_arrays 0 1
check 'left out' have_no_superblock sdc1 sdc2 sdd1 sdd2
check 'but partitioned' table_is sdd "$LAYOUT_8"

machine internalportcfg=0xf maxdisks=
installs_none
check 'no slot at all' logged 'err Failed to NLIBCFileGetKeyValue(/etc.defaults/nuroinfo.conf,maxdisks)'
check 'all left out' have_no_superblock sda1 sdb1 sdc1 sdd1 sda2 sdb2 sdc2 sdd2
check 'data array only' [ "$(arrays_known)" = 2 ]
verdict 'more disks than slots'

machine internalportcfg=0x4
watch_writes sda sdb sdd
installs "$LAYOUT_8" sdc missing missing missing
check 'the others are left alone' nothing_written
verdict 'one disk'

# The disks of the data array while it runs are safe; the others lose everything.
machine internalportcfg=0xf
touch /.force_clean_all_disk
must mount -o ro /dev/md2 /mnt
must sfdisk -N3 '' -uS -q -f -j260352 -z-1 -tfd -F /dev/sdc
check 'all are to be formatted' enum_says 4 '1 2 3 4 '
check_initsys sdc sdd missing missing
check 'a disk in use' logged_not_made sda
check 'the other one' logged_not_made sdb
check 'sda' table_is sda "$WHOLE_8"
check 'sdc' table_is sdc "$LAYOUT_8"
umount /mnt
check 'data' data_is_whole md2
verdict 'by force, with a data array that is in use'

stop_arrays 0 1 2
check_initsys sda sdb sdc sdd
check_tables "$LAYOUT_8" $INTERNAL
rm /.force_clean_all_disk
verdict 'by force, with a data array that is not'

finish
