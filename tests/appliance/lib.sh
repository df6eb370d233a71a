# SPDX-License-Identifier: MIT
# shellcheck shell=sh
#
# What the cases share. They run inside the appliance under BusyBox sh; the runner outside reads
# the lines "plan N", "ok NAME", "not ok NAME" and "end", and takes anything else as an explanation.

export PATH=/usr/bin:/usr/sbin

EXPECTED=/tmp/expected
SEEN=/tmp/seen
ERRORS=/tmp/errors
SYSLOG=/var/log/messages

# Long enough for a busy host; nobody waits longer than the condition takes.
SETTLE_SECONDS=30

# How many verdicts this file gives. Fewer or more mean that it went astray.
plan() {
    echo "plan $1"
}

finish() {
    echo end
    exit 0
}

# What the next verdict needs could not be made: no point in going on.
abort() {
    echo "cannot go on: $*"
    tail -n 20 "$SYSLOG"
    exit 1
}

must() {
    "$@" >/tmp/must 2>&1 || {
        cat /tmp/must
        abort "$* ended with an error"
    }
}

pass() {
    echo "ok $1"
}

fail() {
    echo "not ok $1"
    shift
    for line in "$@"; do
        echo "    $line"
    done
}

show_file() {
    echo "    $1:"
    cat -A "$2" | sed 's/^/        /'
}

# wait_for SECONDS COMMAND...: polls a condition to a bound.
wait_for() {
    tenths=$(($1 * 10))
    shift
    until "$@" >/dev/null 2>&1; do
        tenths=$((tenths - 1))
        [ "$tenths" -gt 0 ] || return 1
        sleep 0.1
    done
}

# --- disks -------------------------------------------------------------------------------------

# partition_disks "64M 64M" sda sdb ...: fresh tables with these partitions and one for the rest.
partition_disks() {
    sizes=$1
    shift
    for disk in "$@"; do
        for size in $sizes; do
            echo ",$size"
        done >/tmp/table
        echo , >>/tmp/table
        must sh -c "sfdisk.stock -q --wipe always /dev/$disk </tmp/table"
    done
}

# pull_disk sdd: as if the drive was taken out of its bay.
pull_disk() {
    echo 1 >"/sys/block/$1/device/delete"
    wait_for "$SETTLE_SECONDS" test ! -e "/sys/block/$1" || abort "$1 cannot be pulled"
}

# --- arrays ------------------------------------------------------------------------------------

# make_array MD ARGUMENT...: mdadm's create mode without its questions.
make_array() {
    number=$1
    shift
    must mdadm --create "/dev/md$number" --run "$@"
}

array_is_gone() {
    ! grep -q "^md$1 :" /proc/mdstat
}

# drop_array MD MEMBER...: stops it and takes its superblocks off, so that the next one starts blank.
drop_array() {
    number=$1
    shift
    must mdadm --stop "/dev/md$number"
    wait_for "$SETTLE_SECONDS" array_is_gone "$number" || abort "md$number does not go away"
    for member in "$@"; do
        must mdadm --zero-superblock "$member"
    done
}

# fail_member MD MEMBER: the driver answers "busy" when the array does not bear the loss, but counts
# it; so the member's own word decides.
fail_member() {
    mdadm "/dev/md$1" --fail "/dev/$2" >/dev/null 2>&1
    wait_for "$SETTLE_SECONDS" grep -q faulty "/sys/block/md$1/md/dev-$2/state" || abort "$2 of md$1 does not fail"
}

# break_array MD MEMBER: fails a member that the driver cannot do without. It keeps the member and
# marks the array instead.
break_array() {
    echo faulty >"/sys/block/md$1/md/dev-$2/state" 2>/dev/null
    wait_for_broken "$1"
}

wait_for_broken() {
    wait_for "$SETTLE_SECONDS" grep -q broken "/sys/block/md$1/md/array_state" || abort "md$1 is not broken"
}

# Keeps a resync from ending before it was looked at, and lets it go on.
slow_resync() {
    echo 1 >/proc/sys/dev/raid/speed_limit_min
    echo 100 >/proc/sys/dev/raid/speed_limit_max
}

fast_resync() {
    echo 1000000 >/proc/sys/dev/raid/speed_limit_max
    echo 1000000 >/proc/sys/dev/raid/speed_limit_min
}

# The array's state in mdadm's words. Whether a write happened a moment ago is no matter here.
mdadm_state() {
    mdadm --detail "/dev/md$1" 2>/dev/null |
        sed -n -e 's/^ *State : //p' | sed -e 's/^active\(-idle\)\{0,1\}/clean/' -e 's/ *$//'
}

mdadm_state_is() {
    [ "$(mdadm_state "$1")" = "$2" ]
}

array_bytes() {
    blockdev --getsize64 "/dev/md$1"
}

# --- the tool ----------------------------------------------------------------------------------

# report MD HEALTH REBUILD LEVEL BYTES MEMBER:WORD...: the report that the tool is to print.
report() {
    printf '/dev/md%s is running, status: %s, rebuilding: %s\n' "$1" "$2" "$3"
    printf 'Device level: %s\n' "$4"
    printf 'Device size: %s MB (%s bytes) \n' "$(($5 / 1048576))" "$5"
    printf 'Disk: \n'
    shift 5
    for member in "$@"; do
        printf '\t [/dev/%s: %s]\n' "${member%%:*}" "${member#*:}"
    done
    printf '\n'
}

# check_run NAME STATUS COMMAND...: what it prints must be, byte for byte, what stands in $EXPECTED.
check_run() {
    name=$1
    expected_status=$2
    shift 2
    "$@" >"$SEEN" 2>"$ERRORS"
    seen_status=$?
    if [ "$seen_status" = "$expected_status" ] && [ ! -s "$ERRORS" ] && cmp -s "$EXPECTED" "$SEEN"
    then
        pass "$name"
        return
    fi
    fail "$name" "command: $*" "expected status $expected_status, seen $seen_status"
    show_file expected "$EXPECTED"
    show_file seen "$SEEN"
    show_file "on standard error" "$ERRORS"
}

# check_status NAME MD MDADM_STATE HEALTH REBUILD LEVEL MEMBER:WORD...: mdadm must see the array in
# the state that the test meant to make, and the tool must report it.
check_status() {
    name=$1
    number=$2
    state=$3
    shift 3
    if ! wait_for "$SETTLE_SECONDS" mdadm_state_is "$number" "$state"; then
        fail "$name" "the array is not what the test wants: mdadm expected '$state'" \
            "seen '$(mdadm_state "$number")'"
        return
    fi
    health=$1
    rebuild=$2
    level=$3
    shift 3
    report "$number" "$health" "$rebuild" "$level" "$(array_bytes "$number")" "$@" >"$EXPECTED"
    check_run "$name" 0 arrayctl status "$number"
}

# check_not_found NAME MD
check_not_found() {
    echo "RAID /dev/md$2 is not found" >"$EXPECTED"
    check_run "$1" 1 arrayctl status "$2"
}
