# SPDX-License-Identifier: MIT
# shellcheck shell=sh
# shellcheck disable=SC2034,SC2046,SC2086  # the cases read what stands here; lists of words
#
# What the cases share that set up machines: other models, disks with a past, and what the tool is
# to leave on them. It brings lib.sh along.
# shellcheck source-path=SCRIPTDIR source-path=SCRIPTDIR/.. source=lib.sh
. /appliance/lib.sh

CONFIGURATION=/etc.defaults/nuroinfo.conf
SCSI_HOSTS=/sys/class/scsi_host
SLEEPS=/tmp/sleeps

# Layout 8, the newest: with disks of 4672 MiB its third partition has 64 MiB.
LAYOUT_8='1 2048 4980480 fd
2 4982528 4194304 fd'
LAYOUT_8_DATA='3 9437184 131072 fd'
WHOLE_8="$LAYOUT_8
$LAYOUT_8_DATA"

# Older ones, with the place for data that their own data partitions have.
WHOLE_7='1 256 4980480 fd
2 4980736 4194304 fd
3 9437184 131072 fd'
WHOLE_6='1 63 4980087 fd
2 4980150 4192965 fd
3 9430155 138101 fd'

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

# bays MASK [KEY=VALUE...]: the disks of this mask are the machine's own, and none is on USB.
bays() {
    mask=$1
    shift
    machine "internalportcfg=$mask" usbportcfg=0x10000 "$@"
}

# expansion_unit /dev/sde,/dev/sdf: what the host adapter reports of a unit behind it.
expansion_unit() {
    must mount -t tmpfs tmpfs "$SCSI_HOSTS"
    must mkdir "$SCSI_HOSTS/host0"
    echo "nuro_device_list=\"$1\"" >"$SCSI_HOSTS/host0/nuro_pm_info"
}

# --- disks -------------------------------------------------------------------------------------

# lay_out DISK TABLE: a fresh table with lines of "NUMBER START SECTORS TYPE".
lay_out() {
    {
        echo 'label: dos'
        echo "$2" | sed 's/\(.*\) \(.*\) \(.*\) \(.*\)/\1 : start=\2, size=\3, type=\4/'
    } >/tmp/table
    must sh -c "sfdisk.stock --lock -q --wipe always --wipe-partitions never /dev/$1 </tmp/table"
}

# The name of the disk that the kernel's test driver made.
debug_disk_name() {
    for folder in /sys/bus/pseudo/drivers/scsi_debug/adapter*/host*/target*/*/block/*; do
        [ -b "/dev/${folder##*/}" ] && echo "${folder##*/}" && return
    done
    return 1
}

# debug_disk PARAMETER...: sets disk.
debug_disk() {
    must modprobe scsi_debug per_host_store=1 dev_size_mb=16 "$@"
    for host in /sys/class/scsi_host/host*; do
        [ "$(cat "$host/proc_name")" = scsi_debug ] && echo '- - -' >"$host/scan"
    done
    await debug_disk_name
    disk=$(debug_disk_name)
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

# check_tables TABLE DISK...: each has these partitions and no other.
check_tables() {
    table=$1
    shift
    for disk in "$@"; do
        check "table of $disk" table_is "$disk" "$table"
    done
}

# A clean ms-dos label, with nothing beside it that another program could take for the disk's.
only_dos() {
    [ "$(wipefs --noheadings -O TYPE "/dev/$1")" = dos ]
}

# How many writes the watched disks have seen. A partition's are counted with its disk's.
writes() {
    sync
    for disk in $watched; do
        awk -v disk="$disk" '{ print disk, $5, $7, $12 }' "/sys/block/$disk/stat"
    done
}

watch_writes() {
    watched=$*
    writes >/tmp/writes
}

# Not one sector of them was written or given up since.
nothing_written() {
    writes | diff /tmp/writes -
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

# claims_are "ARRAY" SLOT...: each superblock tells this of its array, and its own slot in it.
claims_are() {
    claim=$1
    shift
    slot=0
    for member in "$@"; do
        [ "$member" = missing ] || echo "$claim $slot"
        slot=$((slot + 1))
    done | tr '\n' ' ' >"$EXPECTED"
    claims_of $(nodes "$@" | sed 's/missing //g') >"$SEEN"
    diff "$EXPECTED" "$SEEN"
}

# system_arrays_are SLOT...: a disk, or "missing", for every slot of the system and the swap array,
# in the driver's words and in those of each superblock.
system_arrays_are() {
    for part in 1 2; do
        slots=$(printf "%s$part " "$@" | sed "s/missing$part/missing/g")
        array_is $((part - 1)) raid1 0.90 $slots || return 1
        claims_are "0.90.00 raid1 $# $((part - 1))" $slots || return 1
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

# check_initsys SLOT...: it ends well, with a disk or "missing" in every slot, and says which it took.
check_initsys() {
    check 'initsys' says 0 '' arrayctl_awake initsys
    check 'arrays' system_arrays_are "$@"
    check 'what it did' logged_inited $(printf '%s\n' "$@" | grep -v missing)
}

# installs TABLE SLOT...: the same with this table on every disk, and the arrays are stopped again.
installs() {
    installed=$1
    shift
    check_initsys "$@"
    check_tables "$installed" $(printf '%s\n' "$@" | grep -v missing)
    stop_arrays 0 1
}

# installs_none DISK...: it could not set up these, and so none at all.
installs_none() {
    check 'initsys' says 1 '' arrayctl_awake initsys
    for disk in "$@"; do
        check 'why' logged_not_made "$disk"
    done
    check 'the end' logged_no_disk
}

# says STATUS TEXT COMMAND...: the exit status, and every byte on standard output and error. It is
# the log of this run that "logged" then looks at.
says() {
    status=$1
    printf '%b' "$2" >"$EXPECTED"
    shift 2
    log_is_whole
    log_start=$(wc -l <"$SYSLOG")
    answers "$status" "$@"
    said=$?
    log_is_whole
    [ "$said" = 0 ] || log_of_run
    return "$said"
}

log_of_run() {
    tail -n +$((log_start + 1)) "$SYSLOG" |
        sed -n "s/^.* user\.\([a-z]*\) arrayctl: [a-z_]*\.cpp:[0-9]* /\1 /p"
}

# logged "PRIORITY MESSAGE": one whole line of the last run, without its place in the source.
logged() {
    [ "$(log_of_run | grep -cxF -- "$1")" = 1 ] && return
    log_of_run
    return 1
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
