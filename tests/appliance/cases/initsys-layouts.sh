#!/bin/sh
# SPDX-License-Identifier: MIT
# Disks with a past: older layouts with and without data, tables of other systems.
# disks: 10
# size: 4672M
# shellcheck disable=SC2317  # check must call the functions
# shellcheck source=SCRIPTDIR/../lib-setup.sh
. /appliance/lib-setup.sh
plan 9

# data_array MD MEMBER...: with a file system on it.
data_array() {
    data_md=$1
    shift
    array "$data_md" '-l 1 --force' "$@"
    store_data "md$data_md"
}

slow_resync

# Each disk's neighbours are other cases; a mask over the letters says which are in the bays.
bays 0x3
lay_out sda "$WHOLE_7"
store_data sda3
check 'only the blank disk' enum_says 1 '2 '
check_initsys sda sdb missing missing
stop_arrays 0 1
check 'new system partitions, old data partition' table_is sda "$WHOLE_8"
check 'the blank disk' table_is sdb "$LAYOUT_8"
check 'data' data_is_whole sda3
verdict 'layout 7 moves up and keeps its data'

bays 0xc
lay_out sdc "$WHOLE_7"
lay_out sdd "$WHOLE_7"
data_array 2 sdc3 sdd3
check 'none' enum_says 0 ''
installs "$WHOLE_7" sdc sdd missing missing
check 'how it chose' logged_chose 7
check 'data' data_is_whole md2
stop_arrays 2
verdict 'layout 7 stays where the data array is'

bays 0x10
lay_out sde "$WHOLE_6"
check 'this one' enum_says 1 '5 '
installs "$LAYOUT_8" sde missing missing missing
verdict 'layout 6 without an array is wiped'

# The first disk decides what an enumeration looks for, the newest one what an installation makes.
bays 0x60
lay_out sdf "$WHOLE_6"
lay_out sdg "$WHOLE_8"
data_array 3 sdf3
data_array 4 sdg3
check 'none' enum_says 0 ''
check 'no word on one of them' logged 'err Failed to get format type'
watch_writes sdf
installs "$WHOLE_8" sdg missing missing missing
check 'how it chose' logged_chose 8
check 'no word on one of them' logged 'err Failed to get format type'
check 'not a sector of it is written' nothing_written
check_tables "$WHOLE_6" sdf
check 'data of layout 6' data_is_whole md3
check 'data of layout 8' data_is_whole md4
stop_arrays 4
verdict 'layout 6 with an array is left alone beside layout 8'

bays 0x20
installs "$WHOLE_6" sdf missing missing missing
check 'how it chose' logged_chose 6
check 'data' data_is_whole md3
stop_arrays 3
verdict 'layout 6 with an array on its own is renewed'

bays 0x80
printf 'label: gpt\n,1G\n,1G\n,\n' >/tmp/table
for disk in sdh sdi; do
    must sh -c "sfdisk.stock -q --wipe always /dev/$disk </tmp/table"
done
must mkfs.ext4 -q -F /dev/sdh1
check 'all that there are' enum_says 1 '8 '
installs "$LAYOUT_8" sdh missing missing missing
check 'nothing of it is left' only_dos sdh
verdict 'a GPT makes room when nobody has a current layout'

bays 0x101
watch_writes sdi
check 'none' enum_says 0 ''
installs "$WHOLE_8" sda missing missing missing
check 'not a sector of it is written' nothing_written
verdict 'a GPT is left alone beside a current layout'

bays 0x200
lay_out sdj "1 2048 204800 c
2 206848 204800 83
$LAYOUT_8_DATA"
store_data sdj3
check 'all that there are' enum_says 1 '10 '
installs "$WHOLE_8" sdj missing missing missing
check 'data' data_is_whole sdj3
verdict 'partitions of another size are renewed, a third one kept'

lay_out sdj '1 2048 204800 c
2 206848 204800 83
3 411648 9156608 83'
store_data sdj3
installs_none sdj
check 'what is in the way stays' table_is sdj '3 411648 9156608 83'
check 'data' data_is_whole sdj3
check 'no array' [ -z "$(arrays_known)" ]
verdict 'a third partition in the way stays'

finish
