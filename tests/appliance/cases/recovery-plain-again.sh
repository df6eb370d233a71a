#!/bin/sh
# SPDX-License-Identifier: MIT
# The way back of rows 1, 2, 4 and 8 on machines without RAID support, where some or all ran again.
# alone: yes
# disks: 2
# size: 4672M
# shellcheck disable=SC2046,SC2086,SC2154,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-recovery.sh
. /appliance/lib-recovery.sh
plan 9
ALL='sda sdb'

slow_resync
bays 0x3 maxdisks=2 supportraid=no
stand_in

# The older ones are row 3.
for layout in 6 7 8; do
    whole=$(plain_of "$layout")
    lose_system "$whole"
    must arrayctl_awake initsys
    numbers "$layout" 'no RAID'
    with_disks
    way_back 2
    check_way_back "$(plain_of 8 | head -n 2)
$(echo "$whole" | tail -n 1)"
    verdict "row 2: layout $layout without RAID"
done

whole=$(plain_of 3)
rm -r /tmp/kept.*
with_data "$whole"
cut_at before 'sfdisk -N1 *sdb' 1 'sfdisk -N2' 1 initsys
forget
must arrayctl_awake initsys
check_tables "$(echo "$whole" | head -n 2)" sdb
numbers 3 'no RAID'
with_disks sdb
way_back 2
check_way_back "$whole"
verdict 'row 2: layout 3 without RAID, on some disks'

with_data "$whole"
cut_at before 'sfdisk -N1 *sdb' 1 'sfdisk -N2' 1 initsys
forget
numbers 3 'no RAID'
with_disks
way_back 1 stock
must arrayctl_awake initsys
check 'system arrays' system_arrays_are $ALL
check_way_back "$whole"
verdict 'row 1: layout 3 without RAID, with the stock partitioner'

# A machine on which the tool knows no disk leaves none out.
for again in yes no; do
    with_data "$whole"
    cut_at before 'sfdisk -N2 *sdb' 1 'sfdisk -N2' 1 initsys
    forget
    if [ "$again" = yes ]; then
        check 'it is mended' says 0 '' arrayctl_awake initsys
    else
        numbers 3 'no RAID'
        with_disks sdb
        way_back 4
    fi
    check 'system arrays' system_arrays_are $ALL
    check_way_back "$whole"
done
verdict 'row 4: layout 3 without RAID'

# Arrays that run tell nothing of such a layout, so a new disk gets the newest one.
for kind in none '' stock; do
    erased $ALL
    with_data "$whole"
    erased sdb
    bays 0x1 maxdisks=2 supportraid=no
    must arrayctl_awake initsys
    bays 0x3 maxdisks=2 supportraid=no
    check 'the new one' says 0 '' arrayctl_awake initsys
    check_tables "$(plain_of 8 | head -n 2)" sdb
    case $kind in
    none)
        forget
        must arrayctl_awake initsys
        check 'it is taken alone' system_arrays_are sdb missing
        ;;
    *)
        numbers 3 'no RAID'
        with_disks sdb
        way_back 8 $kind
        check_tables "$(echo "$whole" | head -n 2)" sdb
        for number in 0 1; do
            check 'it is taken in' [ -e "/sys/block/md$number/md/dev-sdb$((number + 1))" ]
        done
        forget
        must arrayctl_awake initsys
        check 'both are taken' system_arrays_are $ALL
        ;;
    esac
    forget
done
verdict 'row 8: layout 3 without RAID'

# No array at all; the other disk is another case's.
ALL=sda
bays 0x1 supportraid=no
erased sda
lay_out sda "$(plain_of 8)"
store_data sda3
picture sda3 >/tmp/before
cut_at before 'sfdisk -N1 *' 1 '' 0 initsys
numbers 8 'no RAID'
with_disks
way_back 1
check_tables "$(plain_of 8)" sda
picture sda3 >/tmp/now
check 'every byte' cmp /tmp/before /tmp/now
stop_arrays 0 1
verdict 'row 1: a file system without an array'

cut_at before 'sfdisk -N1 *' 1 '' 0 initsys
must arrayctl_awake initsys
check_tables "$(plain_of 8 | head -n 2)" sda
numbers 8 'no RAID'
with_disks
way_back 2
check_tables "$(plain_of 8)" sda
picture sda3 >/tmp/now
check 'every byte' cmp /tmp/before /tmp/now
verdict 'row 2: a file system without an array'
finish
