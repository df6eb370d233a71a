# SPDX-License-Identifier: MIT
# shellcheck shell=sh
# shellcheck disable=SC2034  # the cases read what stands here
#
# What the cases share that set up machines: other models, disks with a past, and what the tool is
# to leave on them. They source it after lib.sh.

CONFIGURATION=/etc.defaults/nuroinfo.conf
OPERATION_ERRORS=/var/log/space_operation_error.log
SCSI_HOSTS=/sys/class/scsi_host
SLEEPS=/tmp/sleeps
LOG_SECONDS=5

# Layout 8, the newest: with disks of 4672 MiB its third partition has 64 MiB.
LAYOUT_8='1 2048 4980480 fd
2 4982528 4194304 fd'
LAYOUT_8_DATA='3 9437184 131072 fd'

# Older ones, with the place for data that their own data partitions have.
LAYOUT_7='1 256 4980480 fd
2 4980736 4194304 fd'
LAYOUT_7_DATA='3 9437184 131072 fd'
LAYOUT_6='1 63 4980087 fd
2 4980150 4192965 fd'
LAYOUT_6_DATA='3 9430155 138101 fd'

# --- the machine -------------------------------------------------------------------------------

# machine KEY=VALUE...: another model, with USB ports at sde and sdf unless a line says otherwise.
machine() {
    rm -f /tmp/.dualhead /tmp/.not.dualhead
    printf '%s\n' 'maxdisks="4"' 'supportraid="yes"' 'usbportcfg="0x30"' >"$CONFIGURATION"
    for line in "$@"; do
        sed -i "/^${line%%=*}=/d" "$CONFIGURATION"
        echo "$line" >>"$CONFIGURATION"
    done
}

# expansion_unit /dev/sde,/dev/sdf: what the host adapter reports of a unit behind it.
expansion_unit() {
    must mount -t tmpfs tmpfs "$SCSI_HOSTS"
    must mkdir "$SCSI_HOSTS/host0"
    echo "nuro_device_list=\"$1\"" >"$SCSI_HOSTS/host0/nuro_pm_info"
}

expansion_unit_off() {
    must umount "$SCSI_HOSTS"
}

# --- disks -------------------------------------------------------------------------------------

# lay_out DISK TABLE: a fresh table with lines of "NUMBER START SECTORS TYPE".
lay_out() {
    {
        echo 'label: dos'
        echo "$2" | sed 's/\(.*\) \(.*\) \(.*\) \(.*\)/\1 : start=\2, size=\3, type=\4/'
    } >/tmp/table
    must sh -c "sfdisk.stock -q --wipe always --wipe-partitions never /dev/$1 </tmp/table"
}

# The table as the stock partitioner reads it, then as the kernel knows it.
table_of() {
    sfdisk.stock --dump "/dev/$1" | tr -d ' ,' |
        sed -n "s,^/dev/$1\([0-9]*\):start=\(.*\)size=\(.*\)type=\([^/]*\)\$,\1 \2 \3 \4,p"
    for part in /sys/block/"$1/$1"[0-9]*; do
        [ -e "$part" ] || continue
        [ -b "/dev/${part##*/}" ] || echo "no node of ${part##*/}"
        echo "kernel: ${part##*/"$1"} $(cat "$part/start") $(cat "$part/size")"
    done
}

# table_is DISK LINE...: these partitions and no other.
table_is() {
    disk=$1
    shift
    {
        printf '%s\n' "$@"
        printf '%s\n' "$@" | sed 's/^\(.*\) .*$/kernel: \1/'
    } >"$EXPECTED"
    table_of "$disk" >"$SEEN"
    diff "$EXPECTED" "$SEEN"
}

has_no_partition() {
    [ -z "$(table_of "$1")" ]
}

# A clean ms-dos label, with nothing beside it that another program could take for the disk's.
only_dos() {
    [ "$(wipefs --noheadings -O TYPE "/dev/$1")" = dos ]
}

# How many writes a disk has seen. A partition's are counted with it.
writes_of() {
    for disk in "$@"; do
        awk -v disk="$disk" '{ print disk, $5, $7, $12 }' "/sys/block/$disk/stat"
    done
}

watch_writes() {
    watched=$*
    sync
    # shellcheck disable=SC2086
    writes_of $watched >/tmp/writes
}

# Not one sector of the watched disks was written or given up since.
nothing_written() {
    sync
    # shellcheck disable=SC2086
    writes_of $watched | diff /tmp/writes -
}

# --- arrays ------------------------------------------------------------------------------------

# What the driver holds of an array: level, superblock, and the member of each slot in turn.
array_of() {
    md=/sys/block/md$1/md
    printf '%s %s' "$(cat "$md/level")" "$(cat "$md/metadata_version")"
    slot=0
    while [ "$slot" -lt "$(cat "$md/raid_disks")" ]; do
        member=$(readlink "$md/rd$slot") || member=dev-missing
        printf ' %s' "${member#dev-}"
        slot=$((slot + 1))
    done
    echo
}

# array_is MD LEVEL SUPERBLOCK MEMBER...: with "missing" for a slot that is empty.
array_is() {
    number=$1
    shift
    echo "$*" >"$EXPECTED"
    array_of "$number" >"$SEEN"
    diff "$EXPECTED" "$SEEN"
}

# What mdadm reads from the superblocks of members: their version, the level, how many members, of
# which array this is one, and which.
claims_of() {
    mdadm -E "$@" 2>/dev/null | sed -n \
        -e 's/^ *Version : //p' -e 's/^ *Raid Level : //p' -e 's/^ *Raid Devices : //p' \
        -e 's/^ *Name : [^:]*:\([0-9]*\).*/\1/p' -e 's/^ *Preferred Minor : //p' \
        -e 's/^ *Device Role : Active device //p' \
        -e 's/^this *[0-9]* *[0-9]* *[0-9]* *\([0-9]*\) .*/\1/p' | tr '\n' ' '
}

uuid_of() {
    mdadm --detail "/dev/md$1" | sed -n 's/^ *UUID : \([^ ]*\).*/\1/p'
}

# system_arrays_are SLOT...: a disk, or "missing", for every slot of the system and the swap array,
# in the driver's words and in those of each superblock.
system_arrays_are() {
    for part in 1 2; do
        slots=
        nodes=
        claims=
        slot=0
        for disk in "$@"; do
            if [ "$disk" = missing ]; then
                slots="$slots missing"
            else
                slots="$slots $disk$part"
                nodes="$nodes /dev/$disk$part"
                claims="${claims}0.90.00 raid1 $# $((part - 1)) $slot "
            fi
            slot=$((slot + 1))
        done
        # shellcheck disable=SC2086
        array_is $((part - 1)) raid1 0.90 $slots || return 1
        # shellcheck disable=SC2086
        seen_claims=$(claims_of $nodes)
        [ "$seen_claims" = "$claims" ] || {
            echo "superblocks: expected '$claims'"
            echo "seen '$seen_claims'"
            return 1
        }
    done
}

# As if the first resync had come to its end. It would keep a data array on the same disks waiting.
end_resync() {
    for number in "$@"; do
        echo frozen >"/sys/block/md$number/md/sync_action"
        echo none >"/sys/block/md$number/md/resync_start"
        echo idle >"/sys/block/md$number/md/sync_action"
    done
}

# --- data --------------------------------------------------------------------------------------

# store_data DEVICE: a file system that can tell whether its files are still what they were.
store_data() {
    must mkfs.ext4 -q -F -L "$1" "/dev/$1"
    must mount "/dev/$1" /mnt
    head -c 4194304 /dev/urandom >/mnt/file
    (cd /mnt && md5sum file >sum)
    must umount /mnt
}

# data_is_whole DEVICE: the file system that was made on it, and no other.
data_is_whole() {
    e2fsck -fn "/dev/$1" && [ "$(blkid -p -s LABEL -o value "/dev/$1")" = "$1" ] &&
        mount -o ro "/dev/$1" /mnt || return 1
    (cd /mnt && md5sum -c sum)
    same=$?
    umount /mnt && return "$same"
}

# --- the tool ----------------------------------------------------------------------------------

# The tool waits three seconds before it makes each system array. These disks give no reason
# to wait: the call is answered at once, and written down.
arrayctl_awake() {
    : >"$SLEEPS"
    strace -q -o "$SLEEPS" -e signal=none -e trace=clock_nanosleep \
        -e inject=clock_nanosleep:retval=0 arrayctl "$@"
}

slept_before_both_arrays() {
    [ "$(grep -c '{tv_sec=3, tv_nsec=0}' "$SLEEPS")" = 2 ]
}

# says STATUS TEXT COMMAND...: the exit status, and every byte on standard output and error. It is
# the log of this run that "logged" then looks at.
says() {
    status=$1
    printf '%b' "$2" >"$EXPECTED"
    shift 2
    log_start=$(wc -l <"$SYSLOG")
    "$@" >"$SEEN" 2>"$ERRORS"
    seen_status=$?
    [ "$seen_status" = "$status" ] || {
        echo "expected status $status, seen $seen_status"
        tail -n +$((log_start + 1)) "$SYSLOG"
        return 1
    }
    cat "$ERRORS"
    cmp "$EXPECTED" "$SEEN" && [ ! -s "$ERRORS" ]
}

log_of_run() {
    tail -n +$((log_start + 1)) "$SYSLOG" |
        sed "s/^.* user\.\([a-z]*\) arrayctl: [a-z_]*\.cpp:[0-9]* /\1 /"
}

log_has() {
    [ "$(log_of_run | grep -cxF -- "$2")" = "$1" ]
}

# logged "PRIORITY MESSAGE" [TIMES]: whole lines of the last run, without their place in the source.
logged() {
    wait_for "$LOG_SECONDS" log_has "${2:-1}" "$1" || {
        log_of_run
        return 1
    }
}

not_logged() {
    is_not grep -qF -- "$1" <<LINES
$(log_of_run)
LINES
}

# What an installation says of the layout, the disks that it took, one that it could not, and none.
logged_chose() {
    logged "err Choose biggest partition layout version $1."
}

logged_inited() {
    system=$(printf '/dev/%s1 ' "$@")
    swap=$(printf '/dev/%s2 ' "$@")
    logged "err system inited on [$system], [$swap]"
}

logged_not_made() {
    logged "err Failed to create system partition of /dev/$1, newlayout=8, errno=0x2000"
}

logged_no_disk() {
    logged 'err No disk to create system and swap partition, initsys fail!'
}

# enum_says STATUS TEXT: what the enumeration is to print.
enum_says() {
    says "$1" "$2" arrayctl enumformatalldisks
}

# The same for installations of a second head: "all" for any number on a machine that has one.
enum_dual_says() {
    says "$1" "$2" arrayctl enumformatalldisks_indualhead_install
}
