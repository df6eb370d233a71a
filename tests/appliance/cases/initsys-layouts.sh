#!/bin/sh
# SPDX-License-Identifier: MIT
# Disks with a past: older layouts with and without data, tables of other systems.
# disks: 10
# size: 4672M
# shellcheck disable=SC2317  # check must call the functions
# shellcheck source=SCRIPTDIR/../lib.sh
. /appliance/lib.sh
# shellcheck source=SCRIPTDIR/../lib-setup.sh
. /appliance/lib-setup.sh
plan 9

# Each disk's neighbours are other cases; a mask over the letters says which are in the bays.
bays() {
    machine "internalportcfg=$1" 'usbportcfg="0x10000"'
}

data_array() {
    number=$1
    shift
    make_array "$number" --level=1 --raid-devices=$# --assume-clean --force "$@"
    store_data "md$number"
}

layout_7_with_a_file_system() {
    bays 0x3
    lay_out sda "$LAYOUT_7
$LAYOUT_7_DATA"
    store_data sda3
    check 'only the blank disk' enum_says 1 '2 '
    check 'initsys' says 0 '' arrayctl_awake initsys
    check 'new system partitions, old data partition' table_is sda "$LAYOUT_8" "$LAYOUT_7_DATA"
    check 'the blank disk' table_is sdb "$LAYOUT_8"
    check 'arrays' system_arrays_are sda sdb missing missing
    check 'data' data_is_whole sda3
    stop_arrays 0 1
    verdict 'layout 7 moves up and keeps its data'
}

layout_7_with_an_array() {
    bays 0xc
    for disk in sdc sdd; do
        lay_out "$disk" "$LAYOUT_7
$LAYOUT_7_DATA"
    done
    data_array 2 /dev/sdc3 /dev/sdd3
    check 'none' enum_says 0 ''
    check 'initsys' says 0 '' arrayctl_awake initsys
    check 'how it chose' logged_chose 7
    check 'sdc' table_is sdc "$LAYOUT_7" "$LAYOUT_7_DATA"
    check 'sdd' table_is sdd "$LAYOUT_7" "$LAYOUT_7_DATA"
    check 'arrays' system_arrays_are sdc sdd missing missing
    check 'data' data_is_whole md2
    stop_arrays 0 1 2
    verdict 'layout 7 stays where the data array is'
}

layout_6_without_an_array() {
    bays 0x10
    lay_out sde "$LAYOUT_6
$LAYOUT_6_DATA"
    check 'this one' enum_says 1 '5 '
    check 'initsys' says 0 '' arrayctl_awake initsys
    check 'everything is new' table_is sde "$LAYOUT_8"
    check 'arrays' system_arrays_are sde missing missing missing
    stop_arrays 0 1
    verdict 'layout 6 without an array is wiped'
}

# The first disk decides what an enumeration looks for, the newest one what an installation makes.
layout_6_beside_layout_8() {
    bays 0x60
    lay_out sdf "$LAYOUT_6
$LAYOUT_6_DATA"
    lay_out sdg "$LAYOUT_8
$LAYOUT_8_DATA"
    data_array 3 /dev/sdf3
    data_array 4 /dev/sdg3
    check 'none' enum_says 0 ''
    check 'no word on one of them' logged 'err Failed to get format type'
    watch_writes sdf
    check 'initsys' says 0 '' arrayctl_awake initsys
    check 'how it chose' logged_chose 8
    check 'no word on one of them' logged 'err Failed to get format type'
    check 'not a sector of it is written' nothing_written
    check 'sdf' table_is sdf "$LAYOUT_6" "$LAYOUT_6_DATA"
    check 'sdg' table_is sdg "$LAYOUT_8" "$LAYOUT_8_DATA"
    check 'arrays' system_arrays_are sdg missing missing missing
    check 'data of layout 6' data_is_whole md3
    check 'data of layout 8' data_is_whole md4
    stop_arrays 0 1 4
    verdict 'layout 6 with an array is left alone beside layout 8'

    bays 0x20
    check 'initsys' says 0 '' arrayctl_awake initsys
    check 'how it chose' logged_chose 6
    check 'sdf' table_is sdf "$LAYOUT_6" "$LAYOUT_6_DATA"
    check 'arrays' system_arrays_are sdf missing missing missing
    check 'data' data_is_whole md3
    stop_arrays 0 1 3
    verdict 'layout 6 with an array on its own is renewed'
}

foreign_label() {
    bays 0x80
    printf 'label: gpt\n,1G\n,1G\n,\n' >/tmp/table
    for disk in sdh sdi; do
        must sh -c "sfdisk.stock -q --wipe always /dev/$disk </tmp/table"
    done
    must mkfs.ext4 -q -F /dev/sdh1
    check 'all that there are' enum_says 1 '8 '
    check 'initsys' says 0 '' arrayctl_awake initsys
    check 'nothing of it is left' only_dos sdh
    check 'new' table_is sdh "$LAYOUT_8"
    check 'arrays' system_arrays_are sdh missing missing missing
    stop_arrays 0 1
    verdict 'a GPT makes room when nobody has a current layout'

    bays 0x101
    watch_writes sdi
    check 'none' enum_says 0 ''
    check 'initsys' says 0 '' arrayctl_awake initsys
    check 'arrays' system_arrays_are sda missing missing missing
    check 'not a sector of it is written' nothing_written
    stop_arrays 0 1
    verdict 'a GPT is left alone beside a current layout'
}

foreign_partitions() {
    bays 0x200
    lay_out sdj "1 2048 204800 c
2 206848 204800 83
$LAYOUT_8_DATA"
    store_data sdj3
    check 'all that there are' enum_says 1 '10 '
    check 'initsys' says 0 '' arrayctl_awake initsys
    check 'the first two are new' table_is sdj "$LAYOUT_8" "$LAYOUT_8_DATA"
    check 'arrays' system_arrays_are sdj missing missing missing
    check 'data' data_is_whole sdj3
    stop_arrays 0 1
    verdict 'partitions of another size are renewed, a third one kept'

    lay_out sdj '1 2048 204800 c
2 206848 204800 83
3 411648 9156608 83'
    store_data sdj3
    check 'initsys' says 1 '' arrayctl_awake initsys
    check 'no room' logged_not_made sdj
    check 'the end' logged_no_disk
    check 'what is in the way stays' table_is sdj '3 411648 9156608 83'
    check 'data' data_is_whole sdj3
    check 'no array' [ -z "$(arrays_known)" ]
    verdict 'a third partition in the way stays'
}

slow_resync
layout_7_with_a_file_system
layout_7_with_an_array
layout_6_without_an_array
layout_6_beside_layout_8
foreign_label
foreign_partitions
finish
