#!/bin/sh
# SPDX-License-Identifier: MIT
# The tool is killed at a random moment while it makes or takes down a data array, or sets up blank
# disks, alone or with all that it has started, and is run again: the machine is then as if nothing
# had happened.
# disks: 2
# size: 4672M
# shellcheck disable=SC2046,SC2086,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-setup.sh
. /appliance/lib-setup.sh
plan 8

# Forty kills in all.
ROUNDS=16
SETUP_ROUNDS=4
PID=/tmp/pid

now() { # hundredths of a second
    tr -d . </proc/uptime | cut -d' ' -f1
}

# Nothing that a killed run has started is at work any more.
is_quiet() {
    ! cat /proc/[0-9]*/comm 2>/dev/null | grep -qxE 'arrayctl|mdadm|sfdisk|pvs'
}

# kill_within LENGTH alone|all COMMAND...: in a session of its own, so that its group can be killed.
kill_within() {
    moment=$(($(od -An -N2 -tu2 /dev/urandom) % $1))
    whom=$2
    shift 2
    setsid sh -c "echo \$\$ >$PID; exec arrayctl $*" >/dev/null 2>&1 &
    await test -s "$PID"
    usleep $((moment * 10000))
    case $whom in
    alone) kill -9 "$(cat "$PID")" 2>/dev/null ;;
    all) kill -9 "-$(cat "$PID")" 2>/dev/null ;;
    esac
    wait
    : >"$PID"
    await is_quiet
    rest
}

# length_of COMMAND...: of an undisturbed run, in hundredths of a second; at least one.
length_of() {
    begin=$(now)
    arrayctl "$@" >/dev/null 2>&1
    echo $(($(now) - begin + 1))
}

data_array_runs() {
    table_is sda "$WHOLE_8" && table_is sdb "$WHOLE_8" && array_is 2 raid1 1.2 sda3 sdb3
}

# A stopped array is not known any more: what a killed run had not wiped yet stays, and the next
# array is made over it.
count_superblocks_left() {
    if have_no_superblock sda3 sdb3 >/dev/null; then
        wiped=$((wiped + 1))
    else
        left=$((left + 1))
        must mdadm --zero-superblock /dev/sda3 /dev/sdb3
    fi
}

# An array whose members were handed over and that was not started keeps them until a reboot.
stop_half_made() {
    [ "$(cat /sys/block/md2/md/array_state 2>/dev/null)" != inactive ] || stop_arrays 2
}

# round alone|all: each kill is one of the forty.
round() {
    kill_within "$newvol_length" "$1" newvol
    stop_half_made
    arrayctl newvol >/dev/null 2>&1
    check "newvol, killed $1 after ${moment}0 ms" comes data_array_runs

    kill_within "$destroy_length" "$1" destroy 2
    arrayctl destroy 2 >/dev/null 2>&1
    check "destroy, killed $1 after ${moment}0 ms" comes array_left_nothing 2
    count_superblocks_left
}

# Disks that have never been in a machine.
blank() {
    for disk in sda sdb; do
        mdadm -q --zero-superblock "/dev/$disk"[12] 2>/dev/null
        must dd if=/dev/zero of="/dev/$disk" bs=1M count=1 conv=fsync
        read_table_again "$disk"
    done
}

# The driver has forgotten the arrays, as after a reboot: a partitioner leaves alone what is in use.
reboot_arrays() {
    stop_arrays $(arrays_known)
}

partitions_of() {
    set -- "/sys/block/$1/$1"[0-9]*
    [ -e "$1" ] && echo "$#" || echo 0
}

# A disk with a system partition alone has no layout. It waits for somebody who knows it when the
# other disk has one, and the arrays begin without it.
disks_to_expect() {
    case "$(partitions_of sda) $(partitions_of sdb)" in
    '1 2') echo sdb missing ;;
    '2 1') echo sda missing ;;
    *) echo sda sdb ;;
    esac
}

machine_is_set_up() {
    for disk in "$@"; do
        [ "$disk" = missing ] || table_is "$disk" "$LAYOUT_8" || return 1
    done
    system_arrays_are "$@"
}

setup_round() {
    blank
    kill_within "$initsys_length" "$1" initsys
    reboot_arrays
    disks=$(disks_to_expect)
    arrayctl_awake initsys >/dev/null 2>&1
    check "initsys, killed $1 after ${moment}0 ms" comes machine_is_set_up $disks
    reboot_arrays
}

slow_resync
machine internalportcfg=0x3 usbportcfg=0x40 maxdisks=2
lay_out sda "$LAYOUT_8"
lay_out sdb "$LAYOUT_8"

newvol_length=$(length_of newvol)
check 'newvol' data_array_runs
verdict 'newvol without a kill'
destroy_length=$(length_of destroy 2)
check 'destroy' array_left_nothing 2
check 'nothing is left' have_no_superblock sda3 sdb3
verdict 'destroy without a kill'

for whom in alone all; do
    wiped=0
    left=0
    for _ in $(seq $((ROUNDS / 2))); do
        round "$whom"
    done
    verdict "$ROUNDS kills of the tool, $whom: newvol and destroy again"
    check 'each destroy was counted' [ $((wiped + left)) -eq $((ROUNDS / 2)) ]
    echo "superblocks wiped $wiped times, left $left times"
    verdict "superblocks after kills, $whom"
done

blank
initsys_length=$(length_of initsys)
check 'initsys' machine_is_set_up sda sdb
verdict 'initsys without a kill'
reboot_arrays
for whom in alone all; do
    for _ in $(seq "$SETUP_ROUNDS"); do
        setup_round "$whom"
    done
done
verdict "$((2 * SETUP_ROUNDS)) kills of the tool: initsys again"
finish
