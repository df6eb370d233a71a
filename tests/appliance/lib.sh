# SPDX-License-Identifier: MIT
# shellcheck shell=sh
# shellcheck disable=SC2046,SC2086  # lists of words
#
# What the cases share. They run inside the appliance under BusyBox sh; the runner outside reads
# the lines "plan N", "ok NAME", "not ok NAME" and "end", and takes anything else as an explanation.

export PATH=/usr/bin:/usr/sbin

EXPECTED=/tmp/expected
SEEN=/tmp/seen
ERRORS=/tmp/errors
RUNS=/tmp/runs
SYSLOG=/var/log/messages
OPERATION_ERRORS=/var/log/space_operation_error.log

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
    rest
}

has_udev() {
    [ -e /run/udev/control ]
}

# Until udev, where there is one, has done what it does about what happened.
rest() {
    ! has_udev || udevadm settle
}

# --- many checks, one verdict ------------------------------------------------------------------

checks=0
failures=0

# check WHAT COMMAND...: says what was wrong when the command fails.
check() {
    what=$1
    shift
    checks=$((checks + 1))
    "$@" >/tmp/check 2>&1 && rest && return
    failures=$((failures + 1))
    echo "    wrong: $what: $*"
    sed 's/^/        /' /tmp/check
    # A text without a newline would swallow the verdict behind it.
    [ -z "$(tail -c 1 /tmp/check)" ] || echo
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
        echo "ok $1 ($checks checks)"
    else
        echo "not ok $1"
        echo "    $failures of $checks checks failed"
    fi
    checks=0
    failures=0
}

# --- waiting -----------------------------------------------------------------------------------

# comes CONDITION...: sooner or later. Nobody waits longer than it takes; one that does not come true
# within the machine's silence hangs.
comes() {
    tenths=$((SILENCE * 10))
    until "$@" >/dev/null 2>&1; do
        tenths=$((tenths - 1))
        [ "$tenths" -gt 0 ] || return 1
        sleep 0.1
    done
}

# await CONDITION...: what follows needs it.
await() {
    comes "$@" || abort "it does not come to this: $*"
}

# --- disks -------------------------------------------------------------------------------------

# The kernel refuses while somebody has the disk open, as udev does who looks at what was written to it.
read_table_again() { # DISK
    await blockdev --rereadpt "/dev/$1"
    rest
}

# partition_disks "64M 64M" sda sdb ...: fresh tables with these partitions and one for the rest.
partition_disks() {
    sizes=$1
    shift
    for disk in "$@"; do
        printf ',%s\n' $sizes '' >/tmp/table
        must sh -c "sfdisk.stock --lock -q --wipe always /dev/$disk </tmp/table"
    done
}

# pull_disk sdd: as if the drive was taken out of its bay.
pull_disk() {
    echo 1 >"/sys/block/$1/device/delete"
    await test ! -e "/sys/block/$1"
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

# nodes NAME...: as mdadm wants them; an empty slot has no node.
nodes() {
    printf '/dev/%s ' "$@" | sed 's,/dev/missing,missing,g'
}

# The UUID that "array" gives: the next array's differs in the last digit alone.
uuid() {
    printf '5b1f2c3d:4e5f6071:8293a4b5:%08x' "$1"
}

# array MD "OPTIONS" MEMBER...: an array in sync over these members, "missing" for an empty slot.
array() {
    number=$1
    options=$2
    shift 2
    make_array "$number" --uuid="$(uuid "$number")" --assume-clean --raid-devices=$# $options $(nodes "$@")
}

# The level that the kernels of Debian 13 and later do not have any more.
has_linear() {
    case $(uname -r) in
    6.1.*) return 0 ;;
    *) return 1 ;;
    esac
}

array_is_gone() {
    ! grep -q "^md$1 :" /proc/mdstat
}

# stop_arrays MD...: superblocks and members stay as they are.
stop_arrays() {
    for number in "$@"; do
        must mdadm --stop "/dev/md$number"
        await array_left_nothing "$number"
    done
}

# drop_arrays MD...: stops them and takes the superblocks off the members that the driver still lists,
# so that the next one starts blank.
drop_arrays() {
    for number in "$@"; do
        members=
        for entry in "/sys/block/md$number/md/dev-"*; do
            members="$members /dev/${entry##*/dev-}"
        done
        stop_arrays "$number"
        must mdadm --zero-superblock $members
    done
}

# fail_member MD MEMBER: the driver answers "busy" when the array does not bear the loss, but counts
# it; so the member's own word decides.
fail_member() {
    mdadm "/dev/md$1" --fail "/dev/$2" >/dev/null 2>&1
    await grep -q faulty "/sys/block/md$1/md/dev-$2/state"
}

# break_array MD MEMBER: fails a member that the driver cannot do without. It keeps the member and
# marks the array instead.
break_array() {
    echo faulty >"/sys/block/md$1/md/dev-$2/state" 2>/dev/null
    await grep -q broken "/sys/block/md$1/md/array_state"
}

# Keeps a resync from ending before it was looked at, and lets it go on.
slow_resync() {
    echo 1 >/proc/sys/dev/raid/speed_limit_min
    echo 10 >/proc/sys/dev/raid/speed_limit_max
}

fast_resync() {
    echo 1000000 >/proc/sys/dev/raid/speed_limit_max
    echo 1000000 >/proc/sys/dev/raid/speed_limit_min
}

# mdadm_state_is MD WORDS: whether a write happened a moment ago is no matter here.
mdadm_state_is() {
    words=$(mdadm --detail "/dev/md$1" 2>/dev/null | sed -n 's/^ *State : \(.*[^ ]\) *$/\1/p')
    [ "$(echo "$words" | sed 's/^active\(-idle\)\{0,1\}/clean/')" = "$2" ]
}

# settle MD...: the driver calls an array clean again when the last write is a moment old; until then
# its superblocks change by themselves.
settle() {
    sync
    for number in "$@"; do
        await array_is_clean "$number"
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
    mdadm -E $(nodes "$@") 2>&1 | diff /tmp/members -
}

# On no disk and no partition, whatever array they belong to.
uuid_is_nowhere() {
    is_not sh -c "mdadm -E /dev/sd* 2>/dev/null | grep $1"
}

has_no_signature() {
    [ -z "$(blkid -p -s TYPE -o value $(nodes "$@"))" ]
}

# carry MD MEMBER...: each of these has the superblock of that array.
carry() {
    carried=$(uuid "$1")
    shift
    for member in "$@"; do
        mdadm -E "/dev/$member" | grep "UUID : $carried" || return 1
    done
}

# --- the tool ----------------------------------------------------------------------------------

# report MD HEALTH REBUILD LEVEL BYTES MEMBER[:WORD]...: the report that the tool is to print. Behind a
# member without a word stands "Normal".
report() {
    printf '/dev/md%s is running, status: %s, rebuilding: %s\n' "$1" "$2" "$3"
    printf 'Device level: %s\n' "$4"
    printf 'Device size: %s MB (%s bytes) \n' "$(($5 / 1048576))" "$5"
    printf 'Disk: \n'
    shift 5
    for member in "$@"; do
        word=${member#"${member%%:*}"}
        word=${word#:}
        printf '\t [/dev/%s: %s]\n' "${member%%:*}" "${word:-Normal}"
    done
    printf '\n'
}

# answers STATUS COMMAND...: the exit status, what stands in $EXPECTED byte for byte, and no errors.
answers() {
    status=$1
    shift
    "$@" >"$SEEN" 2>"$ERRORS"
    seen_status=$?
    [ "$seen_status" = "$status" ] && [ ! -s "$ERRORS" ] && cmp -s "$EXPECTED" "$SEEN" && return
    echo "expected status $status, seen $seen_status"
    for text in "$EXPECTED" "$SEEN" "$ERRORS"; do
        echo "$text: $(cat -A "$text")"
    done
    return 1
}

# check_report NAME MD HEALTH REBUILD LEVEL MEMBER[:WORD]...
check_report() {
    name=$1
    number=$2
    health=$3
    rebuild=$4
    level=$5
    shift 5
    report "$number" "$health" "$rebuild" "$level" "$(blockdev --getsize64 "/dev/md$number")" "$@" >"$EXPECTED"
    check 'report' answers 0 arrayctl status "$number"
    verdict "$name"
}

# What mdadm calls a state, and the tool's two words for it.
STATES='clean|NORMAL|None
clean, degraded|DEGRADE|None
clean, FAILED|CRASHED|None
clean, resyncing|NORMAL|Progressing...[
clean, resyncing (DELAYED)|NORMAL|Waiting...
clean, resyncing (PENDING)|NORMAL|Waiting...
clean, checking|NORMAL|Progressing...[
clean, degraded, recovering|DEGRADE|Progressing...[
clean, degraded, resyncing (DELAYED)|DEGRADE|Waiting...'

# check_status NAME MD STATE LEVEL MEMBER[:WORD]...: mdadm must see the array in the state that the test
# meant to make, and the tool must report it.
check_status() {
    name=$1
    number=$2
    report_words=$(echo "$STATES" | awk -F'|' -v state="$3" '$1 == state { print $2 "|" $3 }')
    check "$3 in mdadm's words" comes mdadm_state_is "$number" "$3"
    shift 3
    check_report "$name" "$number" "${report_words%|*}" "${report_words#*|}" "$@"
}

# check_not_found NAME MD
check_not_found() {
    echo "RAID /dev/md$2 is not found" >"$EXPECTED"
    check 'report' answers 1 arrayctl status "$2"
    verdict "$1"
}

# check_no_linear NAME MD "OPTIONS" MEMBER...: where the kernel lacks that level, mdadm writes the
# superblocks and fails at the start of the array.
check_no_linear() {
    name=$1
    number=$2
    options=$3
    shift 3
    mdadm --create "/dev/md$number" --run --raid-devices=$# -l linear $options $(nodes "$@") \
        </dev/null >/tmp/refused 2>&1
    check 'status of mdadm' [ $? = 1 ]
    check 'words of mdadm' grep -qx 'mdadm: RUN_ARRAY failed: Invalid argument' /tmp/refused
    check 'no array' comes array_is_gone "$number"
    must mdadm --zero-superblock $(nodes "$@")
    check_not_found "$name: this kernel does not start it" "$number"
}

# --- the system log ----------------------------------------------------------------------------

# Lines arrive in their order: with one more behind them, all that were written are there.
log_is_whole() {
    mark=$(od -An -N4 -tx4 /dev/urandom | tr -d ' ')
    logger -t mark "$mark"
    await grep -q "mark: $mark" "$SYSLOG"
}

# log_of TAG: the lines of that run as "PRIORITY MESSAGE", without the place in the source.
log_of() {
    log_is_whole
    sed -n "s/^.* user\.\([a-z]*\) $1: [a-z_]*\.cpp:[0-9]* /\1 /p" "$SYSLOG"
}

# check_log TAG [COUNT]: all that the run is to have logged stands in $EXPECTED. Members are wiped in
# the order of a hash, so the last COUNT lines are compared sorted.
check_log() {
    log_of "$1" >/tmp/log
    before=$(($(wc -l </tmp/log) - ${2:-0}))
    { head -n "$before" /tmp/log && tail -n "${2:-0}" /tmp/log | sort; } >"$SEEN"
    check "system log of $1" as_expected "$SEEN"
}

# The operation error log without its time stamps; a line with none that is well formed stays whole.
operation_errors() {
    stamp='[A-Z][a-z][a-z] [0-3][0-9] [0-2][0-9]:[0-5][0-9]:[0-5][0-9]'
    sed "s/^$stamp command=/command=/" "$OPERATION_ERRORS" 2>/dev/null
}

# The commands in it, whatever they said; mdadm before 4.4 says something when it stops an array, too.
complaints() {
    operation_errors | sed -e '/^command="\/sbin\/mdadm -S \(.*\)" Error="mdadm: stopped \1 "$/d' \
        -e 's/^command="\(.*\)" Error=".*"$/\1/'
}

# --- destroy -----------------------------------------------------------------------------------

# run_destroy TAG MD: under a name of its own, as the system log tells runs apart by the program's
# name. Leaves TAG.out, TAG.status and TAG.sleeps.
run_destroy() {
    mkdir -p "$RUNS"
    ln -sf /sbin/arrayctl "$RUNS/$1"
    strace -q -o "$RUNS/$1.sleeps" -e signal=none -e trace=clock_nanosleep \
        /sbin/mdrequests "$RUNS/$1" destroy "$2" >"$RUNS/$1.out" 2>&1
    echo $? >"$RUNS/$1.status"
}

# slept COUNT SECONDS FILE: that many pauses of this length in what strace wrote.
slept() {
    [ "$(grep -c "{tv_sec=$2, tv_nsec=0}" "$3")" = "$1" ]
}

# check_output TAG TEXT: the command's exit status is 0 whatever happened.
check_output() {
    printf '%b' "$2" >"$EXPECTED"
    check "output of $1" as_expected "$RUNS/$1.out"
    check "exit status of $1" test "$(cat "$RUNS/$1.status")" = 0
}

# finds_nothing TAG MD: nothing but one line, with a blank at its end.
finds_nothing() {
    run_destroy "$1" "$2"
    check_output "$1" "Not found /dev/md$2 \n"
}

lines() {
    [ -z "$1" ] || printf '%s\n' "$1"
}

# wipes TAG MD COMMANDS MEMBER...: says nothing, and logs the LVM tools that fail and every member.
wipes() {
    tag=$1
    number=$2
    complaining=$3
    shift 3
    rm -f "$OPERATION_ERRORS"
    run_destroy "$tag" "$number"
    check_output "$tag" ''
    {
        lines "$complaining" | sed 's/^/err Failed to /'
        echo "err [Info] clean RAID superblock of /dev/md$number"
        printf "err [Info] Clean RAID superblock on '/dev/%s'\n" "$@"
    } >"$EXPECTED"
    check_log "$tag" $#
    lines "$complaining" >"$EXPECTED"
    complaints >"$SEEN"
    check 'operation error log' as_expected "$SEEN"
}

# left_nothing MD MEMBER...
left_nothing() {
    number=$1
    shift
    check 'the array is gone' comes array_left_nothing "$number"
    check 'no superblock' have_no_superblock "$@"
    check 'no signature' has_no_signature "$@"
    check 'no superblock anywhere' uuid_is_nowhere "$(uuid "$number")"
}

# destroys TAG MD COMMANDS MEMBER...
destroys() {
    wipes "$@"
    shift 3
    left_nothing "$number" "$@"
}

# --- LVM ---------------------------------------------------------------------------------------

# make_group GROUP MD
make_group() {
    must pvcreate -q "/dev/md$2"
    must vgcreate -q "$1" "/dev/md$2"
}

# make_volume GROUP VOLUME EXTENTS: without udev nobody else makes its node.
make_volume() {
    must lvcreate -q -y -l "$3" -n "$2" "$1"
    must dmsetup mknodes
}

# What pvs says of an array decides what a destroy does.
rows_of() {
    pvs -o pv_name,vg_name,lv_name,origin --noheading --separator : | grep "/dev/md$1:"
}

# No group and nothing of its volumes, in LVM or the kernel.
check_no_group() {
    check 'no group' is_not vgs "$1"
    check 'no mapped volume' is_not sh -c "dmsetup ls | grep '^$1-'"
    check 'no node of the volume' test ! -e "/dev/mapper/$1-data"
    check 'no folder of the group' test ! -e "/dev/$1"
}
