#!/bin/sh
# SPDX-License-Identifier: MIT
# Four blank disks become a machine; then the same machine is set up again and again: with its
# arrays running, with data on it, with fewer slots, with one disk, and by force.
# disks: 7
# size: 4672M
# shellcheck disable=SC2317  # check must call the functions
# shellcheck source=SCRIPTDIR/../lib.sh
. /appliance/lib.sh
# shellcheck source=SCRIPTDIR/../lib-setup.sh
. /appliance/lib-setup.sh
plan 11

INTERNAL='sda sdb sdc sdd'
# Two on USB, one on eSATA.
FOREIGN='sde sdf sdg'

no_disk() {
    machine internalportcfg=0x0
    # shellcheck disable=SC2086
    watch_writes $INTERNAL $FOREIGN
    check 'nothing to format' enum_says 0 ''
    check 'nothing to set up' says 1 '' arrayctl initsys
    check 'it says so' logged_no_disk
    check 'no disk is touched' nothing_written
    check 'no array' [ -z "$(arrays_known)" ]
    verdict 'no disk in the bays'
}

each_disk_is() {
    for disk in $INTERNAL; do
        check "table of $disk" table_is "$disk" "$@"
    done
}

blank_disks() {
    # shellcheck disable=SC2086
    watch_writes $INTERNAL $FOREIGN
    check 'all are to be formatted' enum_says 4 '1 2 3 4 '
    check 'the same for a second head' enum_dual_says 4 '1 2 3 4 '
    check 'a list changes nothing' nothing_written
    verdict 'the numbers of four blank disks'

    # shellcheck disable=SC2086
    watch_writes $FOREIGN
    begin=$(cut -d. -f1 /proc/uptime)
    check 'initsys' says 0 '' arrayctl initsys
    check 'it waits before both arrays' [ $(($(cut -d. -f1 /proc/uptime) - begin)) -ge 6 ]
    check 'it says what it did' logged_inited sda sdb sdc sdd
    each_disk_is "$LAYOUT_8"
    check 'a clean label' only_dos sda
    check 'arrays' system_arrays_are sda sdb sdc sdd
    check 'two arrays' [ "$(arrays_known)" = '0 1' ]
    check 'USB and eSATA disks are left alone' nothing_written
    check 'no tool complained' [ ! -e "$OPERATION_ERRORS" ]
    verdict 'initsys on four blank disks'
    # 2,490,240 and 2,097,152 KiB, less the last whole 64 KiB that an old superblock takes.
    report 0 NORMAL 'Progressing...[' 'RAID 1' 2549940224 \
        sdd1:Normal sdc1:Normal sdb1:Normal sda1:Normal >"$EXPECTED"
    check_run 'the system array at its first resync' 0 arrayctl status 0
    report 1 NORMAL 'Waiting...' 'RAID 1' 2147418112 \
        sdd2:Normal sdc2:Normal sdb2:Normal sda2:Normal >"$EXPECTED"
    check_run 'the swap array waits for it' 0 arrayctl status 1
}

# The partitions in use cannot go, so no disk gets new ones.
running_arrays() {
    uuids="$(uuid_of 0) $(uuid_of 1)"
    check 'current disks need no format' enum_says 0 ''
    check 'initsys' says 1 '' arrayctl initsys
    for disk in $INTERNAL; do
        check 'why' logged_not_made "$disk"
        check 'the driver said no before' \
            logged "debug Failed to do '/sbin/sfdisk --fast-delete 1:2 /dev/$disk'"
    done
    check 'the end' logged_no_disk
    each_disk_is "$LAYOUT_8"
    check 'arrays' system_arrays_are sda sdb sdc sdd
    check 'the same arrays' [ "$(uuid_of 0) $(uuid_of 1)" = "$uuids" ]
    verdict 'initsys while the arrays run'
}

with_data() {
    for disk in sda sdb; do
        must sfdisk -N3 '' -uS -q -f -j260352 -z-1 -tfd -F "/dev/$disk"
    done
    make_array 2 --level=1 --raid-devices=2 --assume-clean /dev/sda3 /dev/sdb3
    store_data md2
    must mount -o ro /dev/md2 /mnt
    stop_arrays 0 1
    check 'initsys' says 0 '' arrayctl_awake initsys
    check 'two pauses' slept_before_both_arrays
    check 'how it chose' logged_chose 8
    check 'what it did' logged_inited sda sdb sdc sdd
    check 'sda' table_is sda "$LAYOUT_8" "$LAYOUT_8_DATA"
    check 'sdb' table_is sdb "$LAYOUT_8" "$LAYOUT_8_DATA"
    check 'sdc' table_is sdc "$LAYOUT_8"
    check 'sdd' table_is sdd "$LAYOUT_8"
    check 'arrays' system_arrays_are sda sdb sdc sdd
    check 'new ones' is_not [ "$(uuid_of 0) $(uuid_of 1)" = "$uuids" ]
    check 'the data array runs' array_is 2 raid1 1.2 sda3 sdb3
    umount /mnt
    check 'data' data_is_whole md2
    verdict 'initsys beside a data array that is in use'
}

too_few_slots() {
    stop_arrays 0 1
    machine internalportcfg=0xf maxdisks=4 max_sys_raid_disks=2
    check 'there is what is to be wiped' [ "$(claims_of /dev/sdc1 /dev/sdd2)" = \
        '0.90.00 raid1 4 0 2 0.90.00 raid1 4 1 3 ' ]
    check 'initsys' says 0 '' arrayctl_awake initsys
    check 'what it did' logged_inited sda sdb
    check 'no slot is left' system_arrays_are sda sdb
    check 'left out' have_no_superblock sdc1 sdc2 sdd1 sdd2
    check 'but partitioned' table_is sdd "$LAYOUT_8"
    stop_arrays 0 1

    machine internalportcfg=0xf maxdisks=
    check 'no slot at all' says 1 '' arrayctl_awake initsys
    check 'why' logged 'err Failed to NLIBCFileGetKeyValue(/etc.defaults/nuroinfo.conf,maxdisks)'
    check 'the end' logged_no_disk
    check 'all left out' have_no_superblock sda1 sdb1 sdc1 sdd1 sda2 sdb2 sdc2 sdd2
    check 'data array only' [ "$(arrays_known)" = 2 ]
    verdict 'more disks than slots'
}

one_disk() {
    machine internalportcfg=0x4
    watch_writes sda sdb sdd
    check 'initsys' says 0 '' arrayctl_awake initsys
    check 'what it did' logged_inited sdc
    check 'three empty slots' system_arrays_are sdc missing missing missing
    check 'the others are left alone' nothing_written
    stop_arrays 0 1
    verdict 'one disk'
}

# The disks of the data array while it runs are safe; the others lose everything.
by_force() {
    machine internalportcfg=0xf
    touch /.force_clean_all_disk
    must mount -o ro /dev/md2 /mnt
    must sfdisk -N3 '' -uS -q -f -j260352 -z-1 -tfd -F /dev/sdc
    check 'all are to be formatted' enum_says 4 '1 2 3 4 '
    check 'initsys' says 0 '' arrayctl_awake initsys
    check 'a disk in use' logged_not_made sda
    check 'the other one' logged_not_made sdb
    check 'what it did' logged_inited sdc sdd
    check 'arrays' system_arrays_are sdc sdd missing missing
    check 'sda' table_is sda "$LAYOUT_8" "$LAYOUT_8_DATA"
    check 'sdc' table_is sdc "$LAYOUT_8"
    umount /mnt
    check 'data' data_is_whole md2
    verdict 'by force, with a data array that is in use'

    stop_arrays 0 1 2
    check 'initsys' says 0 '' arrayctl_awake initsys
    each_disk_is "$LAYOUT_8"
    check 'arrays' system_arrays_are sda sdb sdc sdd
    rm /.force_clean_all_disk
    verdict 'by force, with a data array that is not'
}

slow_resync
no_disk
machine internalportcfg=0xf esataportcfg=0x40
blank_disks
running_arrays
with_data
too_few_slots
one_disk
by_force
finish
