#!/bin/sh
# SPDX-License-Identifier: MIT
#
# The tool's main job from beginning to end, on the blank disks of the virtual appliance.
export PATH=/usr/bin:/usr/sbin

title() {
    printf '\n\033[1m%s\033[0m\n' "$*"
}

# Shows a command as it would be typed, its output, and an exit status other than 0.
run() {
    printf '\033[32m# %s\033[0m\n' "$*"
    "$@"
    status=$?
    [ "$status" -eq 0 ] || echo "(exit status $status)"
}

# Which array a partition's superblock names, if any.
member_of() {
    mdadm -E "$1" 2>/dev/null |
        sed -n 's/.*Preferred Minor : /md/p; s/.*Name : [^:]*:\([0-9]*\).*/md\1/p'
}

disks_show() {
    printf '%-10s %10s %10s  %-5s %s\n' partition start sectors type superblock
    for part in /sys/block/sd?/sd?[0-9]*; do
        dev=/dev/${part##*/}
        type=$(blkid -p -s PART_ENTRY_TYPE -o value "$dev")
        printf '%-10s %10s %10s  %-5s %s\n' "$dev" "$(cat "$part/start")" "$(cat "$part/size")" \
            "${type#0x}" "$(member_of "$dev")"
    done
}

title "Four blank disks. An installation would use these numbers:"
run arrayctl enumformatalldisks | sed 's/ $//'
echo

title "What a real run would do to them; this one changes nothing:"
run arrayctl-rehearse initsys 2>&1 | sed '/^The commands:/,$d'

title "Partitions on every disk, a system array and a swap array:"
run arrayctl initsys
run arrayctl status 0

title "A data array over what is left of the disks; it is usable while it rebuilds:"
run arrayctl newvol
run arrayctl status 2

title "A volume with a file system on it:"
run pvcreate -q /dev/md2
run vgcreate -q vg1 /dev/md2
run lvcreate -q -n volume_1 -L 1G vg1
dmsetup mknodes
run mkfs.ext4 -q /dev/vg1/volume_1
run pvs

title "The array and what is on it, taken down; no superblock of it is left:"
run arrayctl destroy 2
run arrayctl status 2
run pvs

title "What is on each disk now: no data superblock is left, the system is untouched."
disks_show
