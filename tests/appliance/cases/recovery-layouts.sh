#!/bin/sh
# SPDX-License-Identifier: MIT
# The way back of rows 1 to 3 with the numbers of other layouts.
# alone: yes
# disks: 4
# size: 4672M
# shellcheck disable=SC2046,SC2086,SC2154,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-recovery.sh
. /appliance/lib-recovery.sh
plan 3

WHOLE_2='1 63 4980087 fd
2 4980150 1044225 fd
3 6281415 3286841 fd'

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

for table in "$WHOLE_2" "$WHOLE_7"; do
    lose_system "$table"
    numbers "$table"
    way_back 1
    check 'system arrays' system_arrays_are $ALL
    check_way_back "$table"
done
verdict 'row 1: layouts 2 and 7'

lose_system "$WHOLE_2"
must arrayctl_awake initsys
check_tables "$LAYOUT_8" $ALL
check 'its data was where swap is now' [ 6281415 -lt $((4982528 + 4194304)) ]
check 'the sectors are taken' is_not sh -c "echo 'start=6281415, type=fd' | sfdisk.stock -q --no-reread -N3 /dev/sda"
forget
verdict 'row 3: the same with layout 2'

lose_system "$WHOLE_7"
must arrayctl_awake initsys
numbers "$WHOLE_7"
way_back 2
check_tables "$LAYOUT_8
$(echo "$WHOLE_7" | tail -n 1)" $ALL
check_data
forget
verdict 'row 2: layout 7, on disks of layout 8'

finish
