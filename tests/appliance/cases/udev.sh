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
RULES='64-md-raid-assembly 69-lvm'

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

# renew_stopped TAG: initsys where the system arrays have just been stopped.
renew_stopped() {
    uuids=$(uuids_on_disk)
    must mdadm -S /dev/md0 /dev/md1
    rest
    check "both are stopped before $1" is_not grep -q '^md[01] :' /proc/mdstat
    run_logged "$1" 0 initsys
}

uuids_on_disk() {
    mdadm -E /dev/sd[abcd][12] | sed -n 's/^ *UUID : \([^ ]*\).*/\1/p' | sort -u
}

# What an installer does before the tool runs, and takes back when it is done.
mask_rules() {
    for rule in $RULES; do
        must ln -s /dev/null "/etc/udev/rules.d/$rule.rules"
    done
    must udevadm control --reload
}

unmask_rules() {
    for rule in $RULES; do
        must rm "/etc/udev/rules.d/$rule.rules"
    done
    must udevadm control --reload
}

# How far udev is when mdadm makes an array is a matter of luck; here it is done with everything.
udev_is_first() {
    must mv /usr/sbin/mdadm /usr/sbin/mdadm.stock
    cat >/usr/sbin/mdadm <<'SCRIPT'
#!/bin/sh
[ "$1" != -C ] || udevadm settle
exec mdadm.stock "$@"
SCRIPT
    chmod +x /usr/sbin/mdadm
}

must mkdir -p /etc/udev/rules.d
if [ "$1" = 1 ]; then
    plan 3
    mask_rules
    run_logged blank 0 initsys
    check 'two arrays' [ "$(arrays_known)" = '0 1' ]
    run_logged data 0 newvol
    check 'three arrays' [ "$(arrays_known)" = '0 1 2' ]
    make_group vg1 2
    must lvcreate -q -y -l 8 -n volume_1 vg1
    check 'udev makes its node' comes test -b /dev/vg1/volume_1
    verdict 'blank disks, with the rules masked'

    renew_stopped masked
    check 'no superblock of before' is_not sh -c "echo '$(uuids_on_disk)' | grep '$uuids'"
    { echo 'err Choose biggest partition layout version 8.' && echo "$INITED"; } >"$EXPECTED"
    check_log masked
    verdict 'arrays that were stopped, with the rules masked'

    # A partition made anew at its old place carries its old superblock. udev assembles the old array
    # from these before the tool comes to make the new one.
    udev_is_first
    unmask_rules
    renew_stopped beaten
    check 'every superblock of before' [ "$(uuids_on_disk)" = "$uuids" ]
    {
        echo 'err Choose biggest partition layout version 8.'
        not_made 0 "$SYSTEM_MEMBERS"
        not_made 1 "$SWAP_MEMBERS"
        echo "$INITED"
    } >"$EXPECTED"
    check_log beaten
    verdict 'the same without masks: the old arrays are back, and initsys says that all is well'
else
    plan 3
    check 'the data array runs' grep -q '^md2 : active' /proc/mdstat
    check 'the volume is active' test -b /dev/vg1/volume_1
    arrays=$(arrays_known)
    run_logged running 1 initsys
    check 'they still run' [ "$(arrays_known)" = "$arrays" ]
    verdict 'after a reboot everything runs, and initsys is refused'

    # A partition that comes and goes while its disk is partitioned leaves such an event behind. When
    # udev comes to it after the array was made, the member is one of the new array.
    must udevadm trigger --settle --action=remove --sysname-match=sdb3
    check 'the member is out' comes sh -c 'mdadm --detail /dev/md2 | grep "State : .*degraded"'
    verdict 'a late event takes a member out of a whole array'

    run_logged destroyed 0 'destroy 2'
    check 'the array is gone' comes array_left_nothing 2
    check 'no superblock' have_no_superblock sda3 sdc3 sdd3
    check_no_group vg1
    verdict 'destroy finds the array at once, and it stays away'
fi
finish
