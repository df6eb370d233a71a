#!/bin/sh
# SPDX-License-Identifier: MIT
# The way back of row 1 on machines without RAID support, with each of their layouts.
# alone: yes
# disks: 2
# size: 4672M
# shellcheck disable=SC2046,SC2086,SC2154,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-recovery.sh
. /appliance/lib-recovery.sh
plan 7
ALL='sda sdb'

slow_resync
bays 0x3 maxdisks=2 supportraid=no
stand_in

# One after the other, as the data of one lies over that of another.
for layout in 1 2 3 5 6 7 8; do
    whole=$(plain_of "$layout")
    lose_system "$whole"
    numbers "$layout" 'no RAID'
    with_disks
    way_back 1
    check 'system arrays' system_arrays_are $ALL
    check_way_back "$whole"
    verdict "row 1: layout $layout without RAID"
done
finish
