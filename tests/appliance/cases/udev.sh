#!/bin/sh
# SPDX-License-Identifier: MIT
# What udev's rules do behind the tool's back on a stock machine, and that nothing of it is left when
# they are masked. The second boot finds what udev makes of the disks of the first.
# disks: 4
# size: 4672M
# boots: 2
# udev: stock
# shellcheck disable=SC2046,SC2086,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-setup.sh
. /appliance/lib-setup.sh

SYSTEM_MEMBERS='/dev/sda1 /dev/sdb1 /dev/sdc1 /dev/sdd1 '
SWAP_MEMBERS='/dev/sda2 /dev/sdb2 /dev/sdc2 /dev/sdd2 '
INITED="err system inited on [$SYSTEM_MEMBERS], [$SWAP_MEMBERS]"
DATA_MEMBERS='sda3 sdb3 sdc3 sdd3'

# not_made MD MEMBERS: what the log says of an array that mdadm did not make.
not_made() {
    echo "err Failed to create RAID '/dev/md$1' on '$2' "
    echo "err szCmd=[/sbin/mdadm -C /dev/md$1 -e 0.9 -amd -R -l1  -n4 $2 > /dev/null 2>&1]"
}

# run_logged TAG STATUS COMMAND: under a name of its own in the system log.
run_logged() {
    mkdir -p "$RUNS"
    ln -sf /sbin/arrayctl "$RUNS/$1"
    mdrequests "$RUNS/$1" $3 >"$RUNS/$1.out" 2>&1
    check "exit status of $1" test $? = "$2"
    rest
}

# renews_stopped TAG: initsys where the system arrays have just been stopped.
renews_stopped() {
    must mdadm -S /dev/md0 /dev/md1
    rest
    check "both are stopped before $1" is_not grep -q '^md[01] :' /proc/mdstat
    run_logged "$1" 0 initsys
    check "four members in both after $1" [ "$(members_of 0) $(members_of 1)" = '4 4' ]
}

members_of() {
    cat "/sys/block/md$1/md/raid_disks"
}

# What an installer does before the tool runs.
mask_rules() {
    for rule in 64-md-raid-assembly 69-lvm; do
        must ln -s /dev/null "/etc/udev/rules.d/$rule.rules"
    done
    must udevadm control --reload
}

must mkdir -p /etc/udev/rules.d
if [ "$1" = 1 ]; then
    plan 3
    run_logged blank 0 initsys
    check 'two arrays' [ "$(arrays_known)" = '0 1' ]
    run_logged data 0 newvol
    check 'three arrays' [ "$(arrays_known)" = '0 1 2' ]
    make_group vg1 2
    must lvcreate -q -y -l 8 -n volume_1 vg1
    check 'udev makes its node' comes test -b /dev/vg1/volume_1
    verdict 'blank disks, as without udev'

    # A partition made anew at its old place carries its old superblock. udev assembles the old array
    # from these before the tool comes to make the new one.
    uuids="$(uuid_of 0) $(uuid_of 1)"
    renews_stopped beaten
    check 'the old arrays' [ "$(uuid_of 0) $(uuid_of 1)" = "$uuids" ]
    {
        echo 'err Choose biggest partition layout version 8.'
        not_made 0 "$SYSTEM_MEMBERS"
        not_made 1 "$SWAP_MEMBERS"
        echo "$INITED"
    } >"$EXPECTED"
    check_log beaten
    verdict 'initsys over arrays that were stopped: the old ones are back, and it says that all is well'

    mask_rules
    renews_stopped masked
    check 'new arrays' is_not [ "$(uuid_of 0) $(uuid_of 1)" = "$uuids" ]
    { echo 'err Choose biggest partition layout version 8.' && echo "$INITED"; } >"$EXPECTED"
    check_log masked
    verdict 'the same with the rules masked'
else
    plan 2
    check 'three arrays run' [ "$(arrays_known)" = '0 1 2' ]
    check 'the volume is active' test -b /dev/vg1/volume_1
    run_logged running 1 initsys
    check 'they still run' [ "$(arrays_known)" = '0 1 2' ]
    verdict 'after a reboot everything runs, and initsys is refused'

    run_logged destroyed 0 'destroy 2'
    check 'the array is gone' comes array_left_nothing 2
    check 'no superblock' have_no_superblock $DATA_MEMBERS
    check_no_group vg1
    check 'two arrays' [ "$(arrays_known)" = '0 1' ]
    verdict 'destroy finds the array at once, and it stays away'
fi
finish
