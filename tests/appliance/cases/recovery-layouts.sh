#!/bin/sh
# SPDX-License-Identifier: MIT
# The way back of rows 1 to 3 with the numbers of other layouts and other kinds of machine.
# disks: 4
# size: 4672M
# shellcheck disable=SC2046,SC2086,SC2154,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-recovery.sh
. /appliance/lib-recovery.sh
plan 8

WHOLE_2='1 63 4980087 fd
2 4980150 1044225 fd
3 6281415 3286841 fd'
PLAIN_8='1 2048 4980480 83
2 4982528 4194304 82
3 9437184 131072 83'
BUILT_IN='1 256 2097152 83
2 2097408 5105569 82
3 7727265 1840991 83'

# numbers TABLE: what has to be set for it, from the page of the layouts.
numbers() {
    echo "$1" | {
        read -r _ start system type
        read -r _ _ swap swap_type
        read -r _ data _ _
        grep -q "^| [1-8] | [^|]* | $start | $system | $type | [0-9]* | $swap | $swap_type | $data | $type |\$" \
            /appliance/layouts.md || abort "docs/layouts.md has no such row"
        with START="$start" SYSTEM="$system" TYPE="$type" SWAP="$swap" SWAP_TYPE="$swap_type" DATA="$data"
    }
}

lose_system() {
    with_data "$1"
    cut_at before 'sfdisk -N1 *' 4 '' 0 initsys
    forget
    check 'partition 3 alone' [ "$(sh /tmp/look | grep -c '^sd. 3:md2$')" = 4 ]
}

check_way_back() {
    check_tables "$1" $ALL
    check 'assembles' assembles
    check_data
    forget
}

block_of - 'sh look' >/tmp/look
slow_resync
bays 0xf
stand_in

for table in "$WHOLE_7" "$WHOLE_6" "$WHOLE_2"; do
    lose_system "$table"
    numbers "$table"
    way_back 1
    check 'system arrays' system_arrays_are $ALL
    check_way_back "$table"
done
verdict 'row 1: layouts 7, 6 and 2'

bays 0xf supportraid=no
lose_system "$PLAIN_8"
numbers "$PLAIN_8"
way_back 1
check 'system arrays' system_arrays_are $ALL
check_way_back "$PLAIN_8"
verdict 'row 1: a machine without RAID support'

bays 0xf supportraid=no support_buildin_storage=yes
lose_system "$BUILT_IN"
numbers "$BUILT_IN"
way_back 1
check 'system arrays' system_arrays_are $ALL
check_way_back "$BUILT_IN"
verdict 'row 1: built-in storage'
bays 0xf

for table in "$WHOLE_7" "$WHOLE_6"; do
    lose_system "$table"
    must arrayctl_awake initsys
    numbers "$table"
    way_back 2
    check_way_back "$LAYOUT_8
$(echo "$table" | tail -n 1)"
done
verdict 'row 2: layouts 7 and 6, on disks of layout 8'

# Two disks still have all, so the machine keeps its layout and gives it to the others.
with_data "$WHOLE_7"
cut_at before 'sfdisk -N1 *sd[bc]' 2 'sfdisk -N2' 2 initsys
forget
must arrayctl_awake initsys
check_tables "${WHOLE_7%
*}" sdb sdc
with DISKS='/dev/sdb /dev/sdc'
way_back 2
check_way_back "$WHOLE_7"
verdict 'row 2: layout 7, on some disks'

bays 0xf supportraid=no
lose_system "$PLAIN_8"
must arrayctl_awake initsys
numbers "$PLAIN_8"
way_back 2
check_way_back "$PLAIN_8"
verdict 'row 2: a machine without RAID support'
bays 0xf

with_data "$WHOLE_6"
cut_at before 'sfdisk -N2 *sdb' 1 'sfdisk -N2' 3 initsys
forget
numbers "$WHOLE_6"
echo DISKS=/dev/sdb >>/tmp/set
way_back 4
check_way_back "$WHOLE_6"
verdict 'row 4: layout 6'

lose_system "$WHOLE_2"
must arrayctl_awake initsys
check_tables "$LAYOUT_8" $ALL
check 'its data was where swap is now' [ 6281415 -lt $((4982528 + 4194304)) ]
check 'the sectors are taken' is_not sh -c "echo 'start=6281415, type=fd' | sfdisk.stock -q --no-reread -N3 /dev/sda"
forget
verdict 'row 3: the same with layout 2'
finish
