#!/bin/sh
# SPDX-License-Identifier: MIT
# Arrays that are in use stay as they are, and arrays that are not there are not found.
# disks: 4
# size: 64M
# shellcheck source=SCRIPTDIR/../lib.sh
. /appliance/lib.sh
plan 8

# The superblock area of a 1.2 array.
superblocks() {
    for node in "$@"; do
        blockdev --flushbufs "/dev/$node"
        echo "$node $(head -c 8192 "/dev/$node" | md5sum)"
    done
}

# make_file_system NODE FOLDER: mounted, with a file, and with nothing left to be written later.
make_file_system() {
    must mkfs.ext4 -q -E lazy_itable_init=0,lazy_journal_init=0 "$1"
    must mkdir "$2"
    must mount "$1" "$2"
    pattern "$2" >"$2/file"
    sync
}

file_is_whole() {
    echo 3 >/proc/sys/vm/drop_caches
    [ "$(md5sum <"$1/file")" = "$(pattern "$1" | md5sum)" ]
}

make_arrays() {
    partition_disks '4M 4M 12M ,E 12M 16M' sda sdb sdc sdd
    make_array 2 --level=5 --raid-devices=3 --assume-clean /dev/sda3 /dev/sdb3 /dev/sdc3
    make_file_system /dev/md2 /mounted
    make_array 3 --level=1 --raid-devices=2 --assume-clean /dev/sda5 /dev/sdb5
    fill md3
    make_array 4 --level=5 --raid-devices=3 --assume-clean /dev/sda6 /dev/sdb6 /dev/sdc6
    must pvcreate -q /dev/md4
    must vgcreate -q group /dev/md4
    must lvcreate -q -y -l 100%FREE -n data group
    must dmsetup mknodes
    make_file_system /dev/group/data /volume
    settle 2 3 4
}

# log_of_three_tries MD: a second's pause follows each.
log_of_three_tries() {
    for _ in 1 2 3; do
        echo "err Failed to mdadm stop '/dev/md$1'"
        echo "err Fail to stop [/dev/md$1], try again"
    done
    echo 'err Reach RAID stop retry limit'
}

# The pause is between the end of one try and the next, so the log's stamps show it.
tries_are_a_second_apart() {
    sed -n "s/^.* \([0-9:]*\) appliance .* $1: .*\(try again\|retry limit\)$/\1/p" "$SYSLOG" |
        awk -F: '{ now = $1 * 3600 + $2 * 60 + $3 }
            NR > 1 && (now - before + 86400) % 86400 < 1 { exit 1 }
            { before = now }'
}

complaints_of() {
    operation_errors | sed 's/ Error=".*"$//' | grep "/dev/$1"
}

commands_of_three_tries() {
    for _ in 1 2 3; do
        echo "command=\"/sbin/mdadm -S /dev/md$1\""
    done
}

# check_stayed TAG MD MEMBER...
check_stayed() {
    tag=$1
    number=$2
    shift 2
    check 'three seconds' test "$(cat "$RUNS/$tag.seconds")" -ge 3
    check 'pauses' tries_are_a_second_apart "$tag"
    check 'runs' array_is_clean "$number"
    superblocks "$@" >"$SEEN"
    check 'superblocks' cmp "/tmp/superblocks$number" "$SEEN"
}

a_mounted_array() {
    run_destroy mounted 2
    check_silent_success mounted
    log_of_three_tries 2 >"$EXPECTED"
    check_log mounted
    commands_of_three_tries 2 >"$EXPECTED"
    complaints_of md2 >"$SEEN"
    check 'operation error log' as_expected "$SEEN"
    check_stayed mounted 2 sda3 sdb3 sdc3
    check 'its file' file_is_whole /mounted
    check 'writable' sh -c 'echo more >/mounted/more && sync'
    verdict 'a mounted array stays'
}

# Mounted under its own name, which is not what is looked for: the volume is not unmounted.
a_mounted_volume() {
    run_destroy volume 4
    check_silent_success volume
    {
        echo 'err Failed to /sbin/lvremove -f /dev/group/data'
        echo 'err Failed to /sbin/vgremove -f /dev/group'
        echo 'err Failed to /sbin/pvremove -f /dev/md4'
        log_of_three_tries 4
    } >"$EXPECTED"
    check_log volume
    {
        echo 'command="/sbin/pvremove -f /dev/md4"'
        commands_of_three_tries 4
    } >"$EXPECTED"
    complaints_of md4 >"$SEEN"
    check 'operation error log' as_expected "$SEEN"
    check_stayed volume 4 sda6 sdb6 sdc6
    check 'its file' file_is_whole /volume
    check 'writable' sh -c 'echo more >/volume/more && sync'
    check 'group' vgs group
    verdict 'an array under a mounted volume stays'
}

# mdadm itself tries for five seconds each time, so it runs beside the others.
an_array_held_open() {
    wait "$held_run"
    check_silent_success held
    log_of_three_tries 3 >"$EXPECTED"
    check_log held
    commands_of_three_tries 3 >"$EXPECTED"
    complaints_of md3 >"$SEEN"
    check 'operation error log' as_expected "$SEEN"
    check_stayed held 3 sda5 sdb5
    check 'its data' holds md3
    verdict 'an array that a program holds open stays'

    kill "$holder"
    wait "$holder"
    run_destroy free 3
    check_silent_success free
    log_of_removal 3 sda5 sdb5 >"$EXPECTED"
    check_log_of_members free 2
    check 'gone' wait_for "$SETTLE_SECONDS" array_left_nothing 3
    check 'no superblock' have_no_superblock sda5 sdb5
    verdict 'the same array goes once it is free'
}

# check_not_there TAG MD: nothing but one line, with a blank at its end.
check_not_there() {
    run_destroy "$1" "$2"
    printf 'Not found /dev/md%s \n' "$2" >"$EXPECTED"
    check 'output' cmp "$EXPECTED" "$RUNS/$1.out"
    check 'exit status' test "$(cat "$RUNS/$1.status")" = 0
}

arrays_that_are_not_there() {
    check_not_there absent 99
    echo 'debug Failed to open /dev/md99, errno=No such file or directory' >"$EXPECTED"
    check_log absent
    verdict 'an array without a node'

    must mknod /dev/md98 b 9 98
    check_not_there hollow 98
    {
        echo 'debug Failed to ioctl for raid status, errno=No such device'
        echo 'debug Failed to ioctl for raid status, errno=0X8000'
    } >"$EXPECTED"
    check_log hollow
    verdict 'a node without an array'

    check_not_there another 97000
    check_not_there zero 0
    verdict 'other numbers'
}

an_array_that_does_not_run() {
    must umount /mounted
    must mdadm --stop /dev/md2
    superblocks sda3 sdb3 sdc3 >/tmp/stopped
    must mknod /dev/md2 b 9 2
    check_not_there stopped 2
    superblocks sda3 sdb3 sdc3 >"$SEEN"
    check 'superblocks' cmp /tmp/stopped "$SEEN"
    check 'assembles' mdadm --assemble /dev/md2 /dev/sda3 /dev/sdb3 /dev/sdc3
    verdict 'a stopped array is not found, and its superblocks stay'
}

make_arrays
superblocks sda3 sdb3 sdc3 >/tmp/superblocks2
superblocks sda5 sdb5 >/tmp/superblocks3
superblocks sda6 sdb6 sdc6 >/tmp/superblocks4

tail -f /dev/null 3</dev/md3 &
holder=$!
run_destroy held 3 &
held_run=$!
a_mounted_array
a_mounted_volume
an_array_held_open
arrays_that_are_not_there
an_array_that_does_not_run

finish
