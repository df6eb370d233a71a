# SPDX-License-Identifier: MIT
# shellcheck shell=sh
#
# What the cases share. They run inside the appliance under BusyBox sh; the runner outside reads
# the lines "plan N", "ok NAME", "not ok NAME" and "end", and takes anything else as an explanation.

export PATH=/usr/bin:/usr/sbin

EXPECTED=/tmp/expected
SEEN=/tmp/seen
ERRORS=/tmp/errors
RUNS=/tmp/runs
SYSLOG=/var/log/messages

# Nobody waits longer than the condition takes; one that does not come true in this time hangs.
SETTLE_SECONDS=$SILENCE

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

# --- many checks, one verdict ------------------------------------------------------------------

checks=0
failures=0

# check WHAT COMMAND...: says what was wrong when the command fails.
check() {
    what=$1
    shift
    checks=$((checks + 1))
    "$@" >/tmp/check 2>&1 && return
    failures=$((failures + 1))
    echo "    wrong: $what: $*"
    sed 's/^/        /' /tmp/check
}

is_not() {
    ! "$@"
}

# What stands in $EXPECTED is what stands in the other file.
as_expected() {
    diff "$EXPECTED" "$1"
}

# verdict NAME: one for all the checks since the one before.
verdict() {
    if [ "$failures" -eq 0 ] && [ "$checks" -gt 0 ]; then
        pass "$1 ($checks checks)"
    else
        fail "$1" "$failures of $checks checks failed"
    fi
    checks=0
    failures=0
}

# --- waiting -----------------------------------------------------------------------------------

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

# picture NODE...: a line for each, another one when a single bit of it changes. What the arrays on
# top wrote went past the node's own cache.
picture() {
    for node in "$@"; do
        blockdev --flushbufs "/dev/$node"
        echo "$node $(md5sum <"/dev/$node")"
    done
}

# Writes lines that name it on a node, and looks whether they are still there.
pattern() {
    yes "$1 keeps this" 2>/dev/null | head -c 262144
}

fill() {
    pattern "$1" >"/dev/$1"
    must blockdev --flushbufs "/dev/$1"
}

holds() {
    [ "$(pattern "$1" | md5sum)" = "$(head -c 262144 "/dev/$1" | md5sum)" ]
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

# stop_arrays MD...: superblocks and members stay as they are.
stop_arrays() {
    for number in "$@"; do
        must mdadm --stop "/dev/md$number"
        wait_for "$SETTLE_SECONDS" array_is_gone "$number" || abort "md$number does not go away"
    done
}

# drop_array MD MEMBER...: stops it and takes its superblocks off, so that the next one starts blank.
drop_array() {
    stop_arrays "$1"
    shift
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

# settle MD...: the driver calls an array clean again when the last write is a moment old; until then
# its superblocks change by themselves.
settle() {
    sync
    for number in "$@"; do
        wait_for "$SETTLE_SECONDS" array_is_clean "$number" || abort "md$number does not settle"
    done
}

array_is_clean() {
    [ "$(cat "/sys/block/md$1/md/array_state")" = clean ]
}

# Of the driver, of sysfs, and of the node: any of them may linger, or come back.
array_left_nothing() {
    array_is_gone "$1" && [ ! -e "/sys/block/md$1" ] && [ ! -e "/dev/md$1" ]
}

# The numbers of all arrays that the driver knows.
arrays_known() {
    sed -n 's/^md\([0-9]*\) :.*/\1/p' /proc/mdstat | sort -n | xargs
}

# have_no_superblock MEMBER...: mdadm has to say it of each.
have_no_superblock() {
    printf 'mdadm: No md superblock detected on /dev/%s.\n' "$@" >/tmp/members
    # shellcheck disable=SC2046  # a list of nodes
    mdadm -E $(printf '/dev/%s ' "$@") 2>&1 | diff /tmp/members -
}

# On no disk and no partition, whatever array they belong to.
uuid_is_nowhere() {
    is_not sh -c "mdadm -E /dev/sd* 2>/dev/null | grep $1"
}

has_no_signature() {
    # shellcheck disable=SC2046
    [ -z "$(blkid -p -s TYPE -o value $(printf '/dev/%s ' "$@"))" ]
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

# --- destroy -----------------------------------------------------------------------------------

# run_destroy TAG MD: under a name of its own, as the system log tells runs apart by the program's
# name. Leaves TAG.out, TAG.status and TAG.seconds.
run_destroy() {
    mkdir -p "$RUNS"
    ln -sf /sbin/arrayctl "$RUNS/$1"
    begin=$(cut -d. -f1 /proc/uptime)
    /sbin/mdrequests "$RUNS/$1" destroy "$2" >"$RUNS/$1.out" 2>&1
    echo $? >"$RUNS/$1.status"
    echo $(($(cut -d. -f1 /proc/uptime) - begin)) >"$RUNS/$1.seconds"
}

# log_of TAG: the lines of that run as "PRIORITY MESSAGE", without the place in the source.
log_of() {
    grep " $1: " "$SYSLOG" | sed "s/^.* user\.\([a-z]*\) $1: [a-z_]*\.cpp:[0-9]* /\1 /"
}

# check_log TAG: all that the run is to have logged stands in $EXPECTED.
check_log() {
    log_of "$1" >"$SEEN"
    check "system log of $1" as_expected "$SEEN"
}

# Members are wiped in the order of a hash, so the last COUNT lines are compared sorted.
check_log_of_members() {
    log_of "$1" >/tmp/log
    before=$(($(wc -l </tmp/log) - $2))
    { head -n "$before" /tmp/log && tail -n "$2" /tmp/log | sort; } >"$SEEN"
    check "system log of $1" as_expected "$SEEN"
}

# The operation error log without its time stamps; a line with none that is well formed stays whole.
operation_errors() {
    stamp='[A-Z][a-z][a-z] [0-3][0-9] [0-2][0-9]:[0-5][0-9]:[0-5][0-9]'
    sed "s/^$stamp command=/command=/" /var/log/space_operation_error.log
}

check_silent_success() {
    : >"$EXPECTED"
    check "output of $1" as_expected "$RUNS/$1.out"
    check "exit status of $1" test "$(cat "$RUNS/$1.status")" = 0
}

# log_of_removal MD MEMBER...: what a removal that goes well logs.
log_of_removal() {
    echo "err [Info] clean RAID superblock of /dev/md$1"
    shift
    for member in "$@"; do
        echo "err [Info] Clean RAID superblock on '/dev/$member'"
    done
}

# check_left_nothing MD UUID MEMBER...
check_left_nothing() {
    number=$1
    uuid=$2
    shift 2
    check 'the array is gone' wait_for "$SETTLE_SECONDS" array_left_nothing "$number"
    check 'no superblock' have_no_superblock "$@"
    check 'no signature' has_no_signature "$@"
    check 'no superblock anywhere' uuid_is_nowhere "$uuid"
}
