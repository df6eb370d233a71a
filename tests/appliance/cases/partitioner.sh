#!/bin/sh
# SPDX-License-Identifier: MIT
#
# The partitioner on real disks: what the kernel knows when it exits, and that partitions in use are
# left alone. Read back with sysfs, /proc/partitions, the stock sfdisk, blkid, wipefs and e2fsck.
# disks: 4
# size: 6G
# shellcheck source=SCRIPTDIR/../lib-setup.sh
. /appliance/lib-setup.sh
plan 11

does() {
    sfdisk "$@" 2>"$ERRORS" && [ ! -s "$ERRORS" ] && return
    cat "$ERRORS"
    return 1
}

# The line it must say, then the command.
refuses() {
    line=$1
    shift
    sfdisk "$@" 2>"$ERRORS" && return 1
    [ "$(cat "$ERRORS")" = "sfdisk: $line" ] && return
    cat "$ERRORS"
    return 1
}

creates() {
    does "-N$2" "" -uS -q -f "-j$3" "-z$4" "-t$5" -F "/dev/$1"
}

# Disk, number, start, size: the kernel's numbers, the node, and the line in /proc/partitions.
knows() {
    [ "$(cat "/sys/block/$1/$1$2/start" 2>&1)" = "$3" ] &&
        [ "$(cat "/sys/block/$1/$1$2/size" 2>&1)" = "$4" ] &&
        [ -b "/dev/$1$2" ] && grep -q " $1$2\$" /proc/partitions
}

forgot() {
    [ ! -e "/sys/block/$1/$1$2" ] && [ ! -e "/dev/$1$2" ] && ! grep -q " $1$2\$" /proc/partitions
}

table_has() {
    sfdisk.stock --dump "/dev/$1" | grep -q "^/dev/$1$2 : start= *$3, size= *$4, type=$5\$"
}

stock_table() {
    echo "$2" >/tmp/table
    must sh -c "sfdisk.stock -q --wipe always /dev/$1 </tmp/table"
}

# The last thing before the kernel learns of it is that the disk has it.
synced() {
    strace -o /tmp/trace -e trace=write,pwrite64,fsync,ioctl sfdisk -N3 -uS -j0 -z10 -tfd /dev/sdd
    last=$(grep -E 'write|fsync|BLKPG' /tmp/trace | tail -n 2 | cut -d'(' -f1)
    [ "$last" = "fsync
ioctl" ]
}

# makes DISK NUMBER GAP SIZE TYPE START SECTORS: what it is asked for, and what the kernel knows at once.
makes() {
    check "$1$2 is made" creates "$1" "$2" "$3" "$4" "$5"
    check "$1$2 is known" knows "$1" "$2" "$6" "$7"
}

# gone DISK NUMBER...
gone() {
    on=$1
    shift
    for part in "$@"; do
        check "$on$part is gone" forgot "$on" "$part"
    done
}

# deletes RANGE DISK NUMBER...: these are gone then.
deletes() {
    check "delete $1 of $2" does --fast-delete "$1" "/dev/$2"
    shift
    gone "$@"
}

signs() {
    check "sign $1" does -M1 "/dev/$1"
}

in_use() {
    check "partition $1 of $2 is in use" refuses "partition $1 of /dev/$2 is in use" --fast-delete "$3" "/dev/$2"
}

# waits_for HOLDER ARGUMENT...: the partitioner is stopped when it begins to wait for the process that
# holds the disk; that one ends, and the partitioner goes on and succeeds.
waits_for() {
    holder=$1
    shift
    strace -q -o /tmp/trace -e trace=clock_nanosleep -e inject=clock_nanosleep:signal=STOP:when=1 \
        sfdisk "$@" &
    await grep -q 'stopped by SIGSTOP' /tmp/trace
    kill "$holder"
    wait "$holder"
    kill -CONT "$(pidof sfdisk)"
    wait "$!"
}

signs sda
check "clean table" only_dos sda
makes sda 1 2048 4980480 fd 2048 4980480
makes sda 2 0 4194304 fd 4982528 4194304
makes sda 3 260352 -1 fd 9437184 $(($(cat /sys/block/sda/size) - 9437184))
check "table 1" table_has sda 1 2048 4980480 fd
check "table 2" table_has sda 2 4982528 4194304 fd
check "line of 2" [ "$(sfdisk -l -uS -N2 /dev/sda)" = "/dev/sda2 4982528 9176831 4194304 fd" ]
check "no line of 4" [ "$(sfdisk -l -uS -N4 /dev/sda)" = "" ]
deletes 3:128 sda 3
check "a partition is no disk" refuses "/dev/sda1 is a partition, no disk" -M1 /dev/sda1
check "an absent disk" refuses "cannot open /dev/sdz: No such file or directory" -M1 /dev/sdz
verdict 'the layout of the appliance'

must mkfs.ext4 -q /dev/sda1
must mount /dev/sda1 /mnt
echo precious >/mnt/file
check "the kernel reads no whole table now" is_not blockdev --rereadpt /dev/sda 2>/dev/null
makes sda 3 260352 1000000 83 9437184 1000000
signs sda
deletes 3:128 sda 3
in_use 1 sda -1
in_use 1 sda 1:2
check "1 stays" knows sda 1 2048 4980480
check "2 stays" knows sda 2 4982528 4194304
check "1 stays in the table" table_has sda 1 2048 4980480 fd
check "2 stays in the table" table_has sda 2 4982528 4194304 fd
check "1 exists" refuses "partition 1 of /dev/sda exists already" \
    -N1 -uS -q -f -j2048 -z4980480 -tfd -F /dev/sda
check "the file is there" [ "$(cat /mnt/file)" = precious ]
must umount /mnt
check "file system is whole" e2fsck -fn /dev/sda1 >/dev/null 2>&1
verdict 'beside a mounted partition'

signs sdb
check "sdb1" creates sdb 1 2048 4980480 fd
check "sdb2" creates sdb 2 0 4194304 fd
array 0 '-e 0.9 -l 1' sda1 sdb1
in_use 1 sdb -1
check "sdb2 came back" knows sdb 2 4982528 4194304
check "data partition beside the array" creates sdb 3 260352 -1 fd
must pvcreate /dev/sdb3
must vgcreate group /dev/sdb3
must lvcreate -L 64M -n volume group
in_use 3 sdb 3:128
must lvremove -f group
must vgremove -f group
deletes 3:128 sdb
stop_arrays 0
deletes -1 sdb 1 2
signs sdb
verdict 'beside an array and a volume'

check "sdb1" creates sdb 1 2048 10000 fd
tail -f /dev/null 3</dev/sdb1 &
await test -e "/proc/$!/fd/3"
check "a look is waited for" waits_for "$!" --fast-delete -1 /dev/sdb
gone sdb 1
verdict 'who only looks is waited for'

stock_table sdc 'label: gpt
start=2048, size=100000
start=104448, size=100000'
check "gpt is known" knows sdc 2 104448 100000
must mkfs.ext4 -q /dev/sdc2
must mount /dev/sdc2 /mnt
check "a mounted gpt" refuses "/dev/sdc is in use" -M1 /dev/sdc
check "a mounted gpt stays" test "$(blkid -p -s PTTYPE -o value /dev/sdc)" = gpt
check "its partitions stay" knows sdc 1 2048 100000
must umount /mnt
check "no partition in a gpt" refuses "/dev/sdc has no ms-dos partition table" \
    -N3 -uS -j0 -z100 -tfd /dev/sdc
signs sdc
check "no ghost" only_dos sdc
gone sdc 1 2
blockdev --rereadpt /dev/sdc
gone sdc 1

must wipefs -qa /dev/sdc
must mkfs.ext4 -qF /dev/sdc
must mount /dev/sdc /mnt
check "a mounted disk" refuses "/dev/sdc is in use" -M1 /dev/sdc
must umount /mnt
check "the file system is whole" e2fsck -fn /dev/sdc >/dev/null 2>&1
signs sdc
check "no ghost of it" only_dos sdc
verdict 'foreign tables and whole disks in use'

stock_table sdc 'label: dos
1: start=2048, size=2048, type=fd
4: start=8192, size=100000, type=5
5: start=10240, size=2048, type=83
6: start=14336, size=2048, type=83
7: start=18432, size=4096, type=83'
check "7 is known" knows sdc 7 18432 4096
exec 7</dev/sdc7
check "7 would move" refuses "partition 7 of /dev/sdc is in use" --fast-delete 6:6 /dev/sdc
check "6 stays" knows sdc 6 14336 2048
exec 7<&-
deletes 6:6 sdc 7
check "7 is 6 now" knows sdc 6 18432 4096
check "5 stays" knows sdc 5 10240 2048
blockdev --rereadpt /dev/sdc
check "the kernel reads the same" knows sdc 6 18432 4096
must dd if=/dev/sdc of=/tmp/tables bs=512 count=20000
deletes -1 sdc
must dd if=/tmp/tables of=/dev/sdc bs=512 conv=notrunc
signs sdc
check "5 is known again" knows sdc 5 10240 2048
check "6 is known again" knows sdc 6 18432 4096
check "of 4 only its beginning" knows sdc 4 8192 2
deletes 3:128 sdc 4 5 6
check "1 stays" knows sdc 1 2048 2048
verdict 'logical partitions'

# The table says one thing and the kernel another, as after a run that was cut short.
check "sdc2" creates sdc 2 0 2048 fd
dd if=/dev/zero of=/dev/sdc bs=512 count=1 conv=notrunc 2>/dev/null
signs sdc
gone sdc 1 2
check "sdc1" creates sdc 1 2048 2048 fd
dd if=/dev/sdc of=/tmp/table bs=512 count=1 2>/dev/null
deletes -1 sdc
dd if=/tmp/table of=/dev/sdc bs=512 count=1 conv=notrunc 2>/dev/null
# udev reads a table as soon as somebody has written one.
has_udev || gone sdc 1
signs sdc
check "the kernel knows" knows sdc 1 2048 2048
verdict 'the table and the kernel differ'

signs sdd
flock /dev/sdd tail -f /dev/null &
await grep -q 'FLOCK.*WRITE' /proc/locks
check "a locked disk is waited for" waits_for "$(pidof tail)" -N1 -uS -j2048 -z2048 -tfd /dev/sdd
check "made" knows sdd 1 2048 2048
sfdisk -N2 -uS -j0 -z10 -tfd /dev/sdd &
sfdisk --fast-delete -1 /dev/sdc &
wait
check "two disks at once" knows sdd 2 4096 10
check "the table reaches the disk" synced
verdict 'locks, and data on the disk'

for pause in 0.000 0.005 0.010 0.015 0.020 0.025 0.030 0.040 0.050; do
    for step in "--fast-delete -1" -M1 "-N1 -uS -j2048 -z2048 -tfd"; do
        # shellcheck disable=SC2086  # words, not one word
        sfdisk $step /dev/sdd 2>/dev/null &
        killed=$!
        sleep "$pause"
        kill -KILL "$killed" 2>/dev/null
        wait "$killed" 2>/dev/null
        deletes -1 sdd
        signs sdd
        makes sdd 1 2048 2048 fd 2048 2048
        check "in the table after $step, killed after $pause" table_has sdd 1 2048 2048 fd
    done
done
verdict 'killed and run again'

debug_disk sector_size=4096
check "large sectors" grep -qx 4096 "/sys/block/$disk/queue/logical_block_size"
signs "$disk"
check "half a sector" refuses "partition 1 does not lie on whole sectors of /dev/$disk" \
    -N1 -uS -j63 -z8000 -tfd "/dev/$disk"
makes "$disk" 1 2048 8192 fd 2048 8192
makes "$disk" 2 0 -1 82 10240 $(($(cat "/sys/block/$disk/size") - 10240))
check "line" [ "$(sfdisk -l -uS -N1 "/dev/$disk")" = "/dev/${disk}1 2048 10239 8192 fd" ]
check "stock reads it" table_has "$disk" 1 256 1024 fd
deletes -1 "$disk" 1
must rmmod scsi_debug
verdict 'sectors of 4096 bytes'

debug_disk virtual_gb=3000
check "the disk is large" [ "$(cat "/sys/block/$disk/size")" -gt 4294967296 ]
signs "$disk"
makes "$disk" 1 2048 -1 fd 2048 4294965247
check "no more" refuses \
    "partition 2 does not fit on /dev/$disk: it begins at sector 4294967295 of 4294967295" \
    -N2 -uS -j0 -z-1 -tfd "/dev/$disk"
must rmmod scsi_debug
verdict 'a disk of more than 2 TiB'

finish
