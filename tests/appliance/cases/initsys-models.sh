#!/bin/sh
# SPDX-License-Identifier: MIT
# Other models: with the duplication tool, without RAID support, with built-in storage, with an
# expansion unit behind two heads.
# disks: 8
# size: 4672M
# shellcheck disable=SC2317  # check must call the functions
# shellcheck source=SCRIPTDIR/../lib-setup.sh
. /appliance/lib-setup.sh
plan 10

DUPLICATOR=/bin/nurodd
PLAIN_8='1 2048 4980480 83
2 4982528 4194304 82'
BUILT_IN='1 256 2097152 83
2 2097408 5105569 82'

# A duplicator that writes down what it is given and what is there by then.
install_duplicator() {
    cat >"$DUPLICATOR" <<'SCRIPT'
#!/bin/sh
printf '%s\n' "$@" >/tmp/duplicated
cat /sys/block/sd?/sd?[12]/size >/tmp/duplicated-sizes
sed -n 's/^\(md[0-9]*\) :.*/\1/p' /proc/mdstat >/tmp/duplicated-arrays
echo 'what it says is for nobody'
echo 'nor this' >&2
SCRIPT
    echo "exit $1" >>"$DUPLICATOR"
    chmod +x "$DUPLICATOR"
}

duplication_fails() {
    check "$1" says 0 'system init with nurodd failed\n' arrayctl_awake initsys-dd
    check 'arrays' system_arrays_are sda sdb missing missing
    stop_arrays 0 1
}

# check_newvol MEMBER...: a mirror over these, taken down again.
check_newvol() {
    check 'newvol' says 0 'Creating RAID 1 volume... \n' arrayctl newvol
    check 'data array' array_is 2 raid1 1.2 "$@"
    stop_arrays 2
}

slow_resync

machine internalportcfg=0x3
install_duplicator 0
check 'initsys-dd' says 0 '' arrayctl_awake initsys-dd
printf '%s\n' /dev/sda1 /dev/sdb1 /dev/sda2 /dev/sdb2 >"$EXPECTED"
check 'what it is given' as_expected /tmp/duplicated
printf '%s\n' 4980480 4194304 4980480 4194304 >"$EXPECTED"
check 'the partitions are there by then' as_expected /tmp/duplicated-sizes
check 'the arrays are not' [ ! -s /tmp/duplicated-arrays ]
check 'arrays' system_arrays_are sda sdb missing missing
stop_arrays 0 1
rm /tmp/duplicated
check 'initsys' says 0 '' arrayctl_awake initsys
check 'not without being asked' [ ! -e /tmp/duplicated ]
stop_arrays 0 1
verdict 'the duplicator is given the partitions before the arrays are made'

install_duplicator 3
duplication_fails 'it fails'
check 'it was run' [ -s /tmp/duplicated ]
rm "$DUPLICATOR"
duplication_fails 'it is missing'
verdict 'a duplicator that fails or is missing costs nothing'

install_duplicator 0
machine internalportcfg=0x0
check 'initsys-dd' says 1 '' arrayctl_awake initsys-dd
echo >"$EXPECTED"
check 'two empty lists' as_expected /tmp/duplicated
verdict 'the duplicator runs without a disk, too'

machine internalportcfg=0xc supportraid=no
check 'blank' enum_says 2 '3 4 '
installs "$PLAIN_8" sdc sdd missing missing
check 'current' enum_says 0 ''
check_newvol sdc3 sdd3
check 'sdd' table_is sdd "$PLAIN_8" '3 9437184 131072 83'
verdict 'a machine without RAID support'

machine internalportcfg=0x4 supportraid=no
lay_out sdc '1 63 530082 83
2 530145 787185 82
3 1333332 1000000 83'
store_data sdc3
check 'not one of those with arrays' enum_says 1 '3 '
installs '1 63 530082 83
2 530145 787185 82
3 1333332 1000000 83' sdc missing missing missing
check 'how it chose' logged_chose 3
check 'data' data_is_whole sdc3
verdict 'an old layout that only machines without RAID have'

machine internalportcfg=0x8 support_buildin_storage=yes
installs_none sdd
check 'no such layout' logged 'err Failed to get partition layout: version=8'
verdict 'built-in storage has no layout with RAID support'

machine internalportcfg=0x8 support_buildin_storage=yes supportraid=no
lay_out sdd "$LAYOUT_8"
check 'to be formatted' enum_says 1 '4 '
installs "$BUILT_IN" sdd missing missing missing
check_newvol sdd3
check 'sdd' table_is sdd "$BUILT_IN" '3 7727265 1840991 83'
installs "$BUILT_IN
3 7727265 1840991 83" sdd missing missing missing
check 'the first of two rows that are alike' logged_chose 7
verdict 'built-in storage without RAID support'

# The bays hold sda to sdd, the unit sdf and sdg; sdh hangs on an eSATA port of its own.
watch_writes sda sdb sdc sdd sde sdh
machine internalportcfg=0xf usbportcfg=0x10 esataportcfg=0xe0 support_dual_head=yes
check 'no unit' enum_says 0 ''
check 'no unit' enum_dual_says 0 ''
installs_none
check 'it remembers two heads' [ -f /tmp/.dualhead ]
verdict 'two heads and no expansion unit'

expansion_unit /dev/sdf,/dev/sdg
check 'the disks of the unit' enum_says 2 '6 7 '
check 'all' enum_dual_says 2 all
installs "$LAYOUT_8" sdf sdg missing missing
check 'none' enum_dual_says 0 ''
check_newvol sdf3 sdg3
check 'nothing else is touched' nothing_written
verdict 'two heads use the expansion unit alone'

machine internalportcfg=0x0 usbportcfg=0x10 esataportcfg=0xe0
check 'no disk' enum_dual_says 0 ''
check 'it remembers one head' [ -f /tmp/.not.dualhead ]
check 'no disk' says 1 'No disk to create RAID... \n' arrayctl newvol
must umount "$SCSI_HOSTS"
verdict 'one head leaves the expansion unit alone'

finish
