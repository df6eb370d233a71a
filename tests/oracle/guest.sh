#!/bin/sh
# SPDX-License-Identifier: MIT
#
# The part of tests/oracle/run-real that runs inside the virtual appliance: sets up one machine after
# the other from /oracle/machines, runs the tool on each and hands back what was seen of it: behind
# the line "# records" stands an archive in base64.
# shellcheck source=SCRIPTDIR/../appliance/lib.sh
. /appliance/lib.sh
# shellcheck source=SCRIPTDIR/../appliance/lib-setup.sh
. /appliance/lib-setup.sh

ORACLE=/oracle
REAL=$ORACLE/real
FAULTS=$ORACLE/faults
CURRENT=$ORACLE/current
RECORDS=$ORACLE/records
DUPLICATOR=/bin/nurodd
VOLUME=/volume1
LETTERS='a b c d e f g h i j'
MARKERS='/.force_clean_all_disk /tmp/.dualhead /tmp/.not.dualhead /tmp/raid.0 /tmp/raid.1 /tmp/raid.5'

# --- the tools ---------------------------------------------------------------------------------

# Between the tool and the real programs stands one script under all their names: it writes down
# what it was called with, passes that on, and keeps the answer.
install_recorder() {
    mkdir -p "$REAL" "$RECORDS"
    mv /usr/sbin/mdadm /usr/sbin/sfdisk /usr/bin/umount "$REAL"
    for program in pvs lvremove vgremove pvremove; do
        ln -s /usr/sbin/lvm "$REAL/$program"
    done
    # The duplication tool succeeds in silence.
    printf '#!/bin/sh\n' >"$REAL/nurodd"
    chmod +x "$REAL/nurodd"
    cat >"$ORACLE/recorder" <<'SCRIPT'
#!/bin/sh
# The newline ends the record, and the whole record is one write.
printf '%s\037' "$$" "$0" "$@" '
' >>/oracle/current/calls
reply=/oracle/current/reply.$$
program=${0##*/}
call="$program $*"
status=
fault() {
    # shellcheck disable=SC2254  # a pattern
    case $call in
    $1)
        status=$2
        : >"$reply.out"
        printf %s "$3" >"$reply.err"
        ;;
    esac
}
. /oracle/faults
if [ -z "$status" ]; then
    "/oracle/real/$program" "$@" >"$reply.out" 2>"$reply.err"
    status=$?
fi
echo "$status" >"$reply.status"
[ -s "$reply.out" ] && cat "$reply.out"
[ -s "$reply.err" ] && cat "$reply.err" >&2
exit "$status"
SCRIPT
    chmod +x "$ORACLE/recorder"
}

TOOLS="/usr/sbin/mdadm /usr/sbin/sfdisk /usr/sbin/pvs /usr/sbin/lvremove /usr/sbin/vgremove
    /usr/sbin/pvremove /usr/bin/umount $DUPLICATOR"

restore_tools() {
    for program in $TOOLS; do
        ln -sf "$ORACLE/recorder" "$program"
    done
    : >"$FAULTS"
}

missing() {
    rm "$1"
}

# fault PROGRAM PATTERN STATUS TEXT: such calls fail without being passed on.
fault() {
    printf "fault '%s %s' %s '%s'\n" "$@" >>"$FAULTS"
}

# --- the machine -------------------------------------------------------------------------------

is_present() {
    [ -b "/dev/sd$1" ] && [ -e "/sys/block/sd$1/size" ]
}

all_present() {
    target=0
    for letter in $LETTERS; do
        is_present "$letter" || {
            must sh -c "echo '0 $target 0' >'$SCSI_HOSTS/host0/scan'"
            comes is_present "$letter" || abort "sd$letter does not come back"
        }
        target=$((target + 1))
    done
}

close_groups() {
    ! grep -q " $VOLUME " /proc/mounts || must "$REAL/umount" "$VOLUME"
    must lvm vgchange -q -a n
}

stop_all() {
    for number in $(arrays_known); do
        must "$REAL/mdadm" -q --stop "/dev/md$number"
        comes array_is_gone "$number" || abort "md$number does not go away"
    done
}

# begin SEED: ten blank disks, the stock of tools and no trace of the machine before.
begin() {
    seed=$1
    echo "# machine $seed"
    ! grep -q " $SCSI_HOSTS tmpfs " /proc/mounts || must "$REAL/umount" "$SCSI_HOSTS"
    close_groups
    stop_all
    all_present
    for letter in $LETTERS; do
        must blkdiscard -f "/dev/sd$letter"
    done
    # shellcheck disable=SC2086  # a list
    rm -f $MARKERS "$CONFIGURATION" "$OPERATION_ERRORS"
    rm -rf "$CURRENT"
    mkdir "$CURRENT"
    restore_tools
}

# present DISK...: every other disk is pulled.
present() {
    for letter in $LETTERS; do
        case " $* " in
        *" sd$letter "*) ;;
        *) pull_disk "sd$letter" ;;
        esac
    done
}

conf() {
    printf %s "$1" >"$CONFIGURATION"
}

marker() {
    : >"$1"
}

hosts_begin() {
    must mount -t tmpfs tmpfs "$SCSI_HOSTS"
}

# host NAME [TEXT]
host() {
    mkdir "$SCSI_HOSTS/$1"
    [ $# -eq 1 ] || printf %s "$2" >"$SCSI_HOSTS/$1/nuro_pm_info"
}

# sector DISK NUMBER ESCAPES
sector() {
    # shellcheck disable=SC2059  # escapes
    printf "$3" | dd of="/dev/$1" bs=512 seek="$2" conv=notrunc 2>/dev/null
}

gpt_table() {
    printf %s "$2" >/tmp/table
    must sh -c "sfdisk.stock -q --wipe never --wipe-partitions never /dev/$1 </tmp/table"
}

tables_made() {
    for disk in /dev/sd?; do
        must blockdev --rereadpt "$disk"
    done
}

create() {
    bitmap=--bitmap=none
    case " $* " in
    *' -l0 '*) bitmap= ;; # it takes no word about one
    esac
    must "$REAL/mdadm" --create "$@" --run --assume-clean $bitmap
}

# whole DISK MD: a superblock at the disk's end.
whole() {
    create "/dev/md$2" -e 0.90 -l1 -n1 -f "/dev/$1"
    must "$REAL/mdadm" -q --stop "/dev/md$2"
}

# array MD running|stopped ARGUMENT...
array() {
    number=$1
    fate=$2
    shift 2
    create "/dev/md$number" "$@"
    [ "$fate" = running ] || must "$REAL/mdadm" -q --stop "/dev/md$number"
}

# group MD full|open COUNT mounted|closed: a group on an array, with so many volumes that fill it, or not.
group() {
    must pvcreate -q "/dev/md$1"
    must vgcreate -q -s 1M "vg$1" "/dev/md$1"
    [ "$3" = 1 ] || make_volume "vg$1" volume_2 8
    [ "$2" = open ] && extents=8 || extents=100%FREE
    make_volume "vg$1" volume_1 "$extents"
    must mkfs.ext4 -q "/dev/vg$1/volume_1"
    [ "$4" = closed ] || {
        mkdir -p "$VOLUME"
        must mount "/dev/vg$1/volume_1" "$VOLUME"
    }
}

# --- the run -----------------------------------------------------------------------------------

# What the tool will find in sysfs: disks, partitions, members of the system array, adapters.
record_machine() {
    for disk in /sys/block/sd*; do
        name=${disk##*/}
        echo "disk $name"
        for part in "$disk/$name"*; do
            [ -e "$part" ] || continue
            read -r start <"$part/start"
            read -r size <"$part/size"
            echo "partition $name ${part##*/"$name"} $start $size"
        done
    done
    for member in /sys/block/md0/md/dev-*; do
        [ ! -e "$member" ] || echo "member ${member##*/dev-}"
    done
    for adapter in "$SCSI_HOSTS"/*; do
        echo "host ${adapter##*/}"
    done
}

record_markers() {
    for marker in $MARKERS; do
        [ ! -e "$marker" ] || echo "$marker"
    done
}

log_is_complete() {
    grep -q ' oracle: end$' "$SYSLOG"
}

# rehearse ARGUMENT...: with the real programs in the recorder's place, where nothing can be written.
rehearse() {
    for program in $TOOLS; do
        [ ! -e "$program" ] || ln -sf "$REAL/${program##*/}" "$program"
    done
    arrayctl-rehearse --commands "$@" >"$CURRENT/rehearsed" 2>"$CURRENT/rehearsed.errors"
    echo $? >"$CURRENT/rehearsed.status"
    for program in $TOOLS; do
        [ ! -e "$program" ] || ln -sf "$ORACLE/recorder" "$program"
    done
}

# run ARGUMENT...: pauses are answered at once, and written down among the calls.
run() {
    record_machine >"$CURRENT/machine"
    : >"$SYSLOG"
    strace -A -q -o "$CURRENT/calls" -e signal=none \
        -e trace=clock_nanosleep -e inject=clock_nanosleep:retval=0 \
        arrayctl "$@" >"$CURRENT/out" 2>"$CURRENT/err"
    echo $? >"$CURRENT/status"
    logger -t oracle end
    comes log_is_complete || abort 'no system log'
    cp "$SYSLOG" "$CURRENT/log"
    [ ! -e "$OPERATION_ERRORS" ] || cp "$OPERATION_ERRORS" "$CURRENT/errors"
    record_markers >"$CURRENT/markers"
    mv "$CURRENT" "$RECORDS/$seed"
}

slow_resync
install_recorder
# shellcheck source=/dev/null
. $ORACLE/machines
echo '# records'
tar -C "$RECORDS" -c . | base64
