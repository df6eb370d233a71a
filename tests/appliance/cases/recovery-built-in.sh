#!/bin/sh
# SPDX-License-Identifier: MIT
# The way back on machines with built-in storage, and where the configuration has that and RAID, too.
# alone: yes
# disks: 2
# size: 4672M
# shellcheck disable=SC2046,SC2086,SC2154,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-recovery.sh
. /appliance/lib-recovery.sh
plan 8
ALL='sda sdb'

BUILT_IN='1 256 2097152 83
2 2097408 5105569 82
3 7727265 1840991 83'

slow_resync
bays 0x3 maxdisks=2 supportraid=no support_buildin_storage=yes
stand_in

for kind in '' stock; do
    lose_system "$BUILT_IN"
    numbers 8 'built-in storage'
    with_disks
    way_back 1 $kind
    [ -z "$kind" ] || must arrayctl_awake initsys
    check 'system arrays' system_arrays_are $ALL
    check_way_back "$BUILT_IN"
done
verdict 'row 1: built-in storage'

for kind in '' stock; do
    lose_system "$BUILT_IN"
    check 'again' says 0 '' arrayctl_awake initsys
    check_tables "$(echo "$BUILT_IN" | head -n 2)" $ALL
    numbers 8 'built-in storage'
    with_disks
    way_back 2 $kind
    check_way_back "$BUILT_IN"
done
verdict 'row 2: built-in storage'

# A machine on which the tool knows no disk leaves none out.
for again in yes no; do
    with_data "$BUILT_IN"
    cut_at before 'sfdisk -N2 *sdb' 1 'sfdisk -N2' 1 initsys
    forget
    if [ "$again" = yes ]; then
        check 'it is mended' says 0 '' arrayctl_awake initsys
    else
        numbers 8 'built-in storage'
        with_disks sdb
        way_back 4
    fi
    check 'system arrays' system_arrays_are $ALL
    check_way_back "$BUILT_IN"
done
verdict 'row 4: built-in storage'

for kind in '' stock; do
    with_data "$BUILT_IN"
    cut_at before 'sfdisk -N3 *sdb' 1 '' 0 newvol
    forget
    numbers 8 'built-in storage'
    with_disks
    way_back 10 $kind
    check_tables "$BUILT_IN" $ALL
    check_data
    forget
done
verdict 'row 10: built-in storage'

for again in yes no; do
    erased $ALL
    cut_at before 'sfdisk -N2 *sdb' 1 'sfdisk -N2' 1 initsys
    forget
    if [ "$again" = yes ]; then
        check 'it is mended' says 0 '' arrayctl_awake initsys
    else
        with_disks sdb
        way_back 6
    fi
    check 'system arrays' system_arrays_are $ALL
    check_tables "$(echo "$BUILT_IN" | head -n 2)" $ALL
    forget
done
verdict 'row 6: built-in storage'

# There is no layout for both.
with_data "$WHOLE_8"
bays 0x3 maxdisks=2 support_buildin_storage=yes
check 'a run' says 1 '' arrayctl_awake initsys
check 'partition 3 alone' [ "$(sh /tmp/look | grep -c '^sd. 3:md2$')" = 2 ]
bays 0x3 maxdisks=2
with_disks
way_back 1
check 'system arrays' system_arrays_are $ALL
check_way_back "$WHOLE_8"
verdict 'row 1: built-in storage and RAID'

with_data "$WHOLE_8"
bays 0x3 maxdisks=2 support_buildin_storage=yes
check 'a run' says 1 '' arrayctl_awake initsys
check 'another one' says 1 '' arrayctl_awake initsys
check 'nothing is left' [ "$(echo /dev/sd[ab][1-3])" = '/dev/sd[ab][1-3]' ]
bays 0x3 maxdisks=2
with_disks
way_back 2
check_way_back "$WHOLE_8"
verdict 'row 2: built-in storage and RAID'

with_data "$WHOLE_8"
bays 0x3 maxdisks=2 support_buildin_storage=yes
check 'newvol' says 1 '' arrayctl newvol
check_tables "$LAYOUT_8" sda
bays 0x3 maxdisks=2
with_disks
way_back 10
check_tables "$WHOLE_8" $ALL
check_data
verdict 'row 10: built-in storage and RAID'
finish
