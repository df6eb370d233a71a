#!/bin/sh
# SPDX-License-Identifier: MIT
# No command's rehearsal changes a sector, and neither does a tool that tries to.
# disks: 2
# size: 72M
# shellcheck disable=SC2016,SC2034,SC2086,SC2317  # scripts; lib.sh reads; lists of words; check calls
# shellcheck source=SCRIPTDIR/../lib-rehearse.sh
. /appliance/lib-rehearse.sh
plan 5
record_calls
watched='sda sdb'
PRIVATE=/tmp/.arrayctl-rehearse

# A tool that says what it could do. $1 is a process outside.
hostile_tool() {
    cat >/hostile <<'SCRIPT'
#!/bin/sh
try() {
    what=$1
    shift
    if "$@" >/dev/null 2>&1; then echo "could $what"; fi
}
zeros() {
    dd if=/dev/zero of="$1" bs=4096 count=16 conv=notrunc,fsync
}
file() {
    echo "$2" >"$1"
}
SCRIPT
    cat >>/hostile
    echo 'echo tried' >>/hostile
    chmod +x /hostile
}

# all_it_could LINE...: the hostile tool is rehearsed, and says this and no more.
all_it_could() {
    {
        [ $# -eq 0 ] || printf 'could %s\n' "$@"
        echo tried
    } | sed 's/^/  /' >"$EXPECTED"
    arrayctl-rehearse --tool /hostile "$witness" >"$TOLD" 2>/tmp/told.errors
    sed -n '/^What it prints:/,/^What it /p' "$TOLD" | grep '^  ' >"$SEEN"
    as_expected "$SEEN"
}

# Small disks, so that every sector of them can be read: the run is the same, with a warning.
partition_disks '4M 4M 24M' sda sdb
must mkswap /dev/sda2
fill sda1
fill sdb1
array 2 '-l 1 --force' sdb3
store_data md2
settle 2
sleep 100000 &
witness=$!
picture $watched >/tmp/picture
watch_writes $watched

check 'initsys' rehearses 3 initsys
check 'initsys-dd' rehearses 3 initsys-dd
check 'newvol' rehearses 3 newvol
check 'destroy' rehearses 0 destroy 2
check 'status' rehearses 0 status 2
check 'enumformatalldisks' rehearses 0 enumformatalldisks
check 'not one sector written' nothing_written
verdict 'each command'

hostile_tool <<'SCRIPT'
for node in sda sda1 sdb3 md2; do
    try "write to $node" zeros "/dev/$node"
    try "discard $node" blkdiscard -f "/dev/$node"
done
try 'write by a node of its own' sh -c 'mknod /tmp/disk b 8 0 && echo >/tmp/disk'
try 'swap to a disk' swapon /dev/sda2
try 'take off a superblock' "/real/mdadm" --zero-superblock --force /dev/sdb3
try 'delete partitions' "/real/sfdisk" --fast-delete -1 /dev/sda
try 'sign a disk with what is kept' /tmp/.arrayctl-rehearse/real/sfdisk -M1 /dev/sda
SCRIPT
check 'nothing' keeps_everything all_it_could
verdict 'it writes to disks'

hostile_tool <<'SCRIPT'
try 'make the root writable' mount -o remount,rw /
try 'make the recorder writable' mount -o remount,rw /tmp/.arrayctl-rehearse
try 'mount a disk' mount -t ext4 /dev/md2 /mnt
try 'mount memory' mount -t tmpfs tmpfs /mnt
try 'lay something over a program' mount --bind /hostile /sbin/mdadm
try 'take the recorder away' umount /usr/sbin/mdadm
try 'take its place away' umount -l /tmp
try 'do so in a namespace of its own' unshare -m mount -o remount,rw /
try 'move the root' pivot_root /mnt /mnt
for folder in / /etc/ /run/ /dev/ /dev/shm/ /real/ /appliance/; do
    try "write to $folder" file "${folder}left" x
done
try 'change the configuration' file /etc.defaults/nuroinfo.conf x
try 'change the recorder' file /tmp/.arrayctl-rehearse/recorder x
try 'remove a program' rm -f /real/mdadm
SCRIPT
check 'nothing' keeps_everything all_it_could
check 'no file' is_not ls /left /etc/left /run/left /dev/left /dev/shm/left /real/left /appliance/left
verdict 'it writes to file systems'

hostile_tool <<'SCRIPT'
try 'kill a process' kill -KILL "$1"
try 'find one' test -e "/proc/$1"
kill -KILL 1
kill -KILL -1
try 'delete a disk' file /sys/block/sda/device/delete 1
try 'stop a sync' file /sys/block/md2/md/sync_action frozen
try 'reset the machine' file /proc/sysrq-trigger b
try 'change the kernel' file /proc/sys/dev/raid/speed_limit_max 1
try 'write to its log' file /dev/kmsg x
try 'load a module' modprobe dm_mirror
try 'set the clock' sh -c 'date -s 2030-01-01; [ "$(date +%Y)" = 2030 ]'
try 'start anew' reboot -f
try 'switch off' poweroff -f
SCRIPT
check 'nothing' keeps_everything all_it_could
check 'the process lives' kill -0 "$witness"
picture $watched >/tmp/picture.now
check 'every sector' diff /tmp/picture /tmp/picture.now
verdict 'it reaches for processes and the kernel, and every sector is as before'

# What the manual page says is not stopped.
hostile_tool <<'SCRIPT'
try 'make a disk read-only' blockdev --setro /dev/sda
try 'stop an array' /real/mdadm -S /dev/md2
SCRIPT
check 'requests' all_it_could 'make a disk read-only' 'stop an array'
check 'the disk' grep -qx 1 /sys/block/sda/ro
check 'the array' comes array_is_gone 2
verdict 'what is not stopped'
finish
