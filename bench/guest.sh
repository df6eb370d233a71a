#!/bin/sh
# SPDX-License-Identifier: MIT
#
# The part of bench/compare that runs inside the virtual appliance: makes the arrays and prints one
# line of numbers for each program.
#
#   guest.sh counts             what does not depend on the machine's mood
#   guest.sh all RUNS ROUNDS    and times, and what the others take
#   guest.sh launcher RUNS ROUNDS   a report under mdrequests beside one that is answered from outside
# shellcheck source=SCRIPTDIR/../tests/appliance/lib.sh
. /appliance/lib.sh

MEASURE=/appliance/bench/measure
VALGRIND=/usr/bin/valgrind.bin
PROFILE=/tmp/profile
LETTERS='a b c d'
PARTITIONS=10

# A table of ten small partitions on each disk.
tables_make() {
    {
        echo 'label: gpt'
        for number in $(seq "$PARTITIONS"); do
            echo ',24M'
        done
    } >/tmp/table
    for letter in $LETTERS; do
        must sh -c "sfdisk.stock -q --wipe always /dev/sd$letter </tmp/table"
    done
}

# mirror MD MEMBER...
mirror() {
    mirror_number=$1
    shift
    make_array "$mirror_number" -e 1.2 --level=1 --raid-devices=$# --assume-clean "$@"
}

# The first of each disk's partitions from FIRST to LAST.
members() {
    for number in $(seq "$1" "$2"); do
        for letter in $LETTERS; do
            echo "/dev/sd$letter$number"
        done
    done
}

# Each number is the array's number of members.
arrays_make() {
    mirror 2 /dev/sda1 /dev/sdb1
    # shellcheck disable=SC2046  # lists of nodes
    mirror 4 $(members 2 2)
    # shellcheck disable=SC2046
    mirror 32 $(members 3 10)
    settle 2 4 32
}

# The exit status of a run that went well: the list of commands is no success.
status_of() {
    case $1 in
    *usage*) echo 1 ;;
    *) echo 0 ;;
    esac
}

# answered COMMAND...: with everything fixed that a program could take from around it. The driver's two
# extra requests are answered from outside, so that nothing of it is counted.
answered() {
    env -i PATH=/usr/bin /usr/sbin/mdrequests "$@"
}

# measured WHAT KEY COMMAND...
measured() {
    what=$1
    key=$2
    shift 2
    # shellcheck disable=SC2086  # "runs" brings its number
    answered "$MEASURE" $what "$(status_of "$key")" "$@"
}

# The allocating functions by the names that callgrind gives them; one that calls another counts
# twice. A name stands in full where it occurs first, then only its number.
# shellcheck disable=SC2016  # the fields are awk's
ALLOCATIONS='
    /^c?fn=/ {
        number = $1
        sub(/^c?fn=/, "", number)
        if (NF > 1) { name[number] = $2 }
        called = name[number]
    }
    /^calls=/ && called ~ /^(malloc|calloc|realloc)$/ { total += substr($1, 7) }
    END { print total + 0 }'

# instructions KEY COMMAND...: instructions and allocations; none of a run that ended otherwise than
# it should.
instructions() {
    key=$1
    shift
    said=$(answered "$VALGRIND" --tool=callgrind "--callgrind-out-file=$PROFILE" "$@" 2>&1)
    [ $? -eq "$(status_of "$key")" ] || return
    collected=$(echo "$said" | sed -n 's/.*Collected : *//p')
    echo "instructions $key $collected $(awk "$ALLOCATIONS" "$PROFILE")"
}

# calls KEY COMMAND...: system calls and children.
calls() {
    echo "calls $1 $(measured calls "$@" 2>/dev/null)"
}

# count KEY COMMAND...: these, instructions and allocations.
count() {
    calls "$@"
    instructions "$@"
}

# runs KEY COMMAND...: minor faults, peak memory, microseconds.
runs() {
    echo "runs $1 $(measured "runs $RUNS" "$@" 2>/dev/null)"
}

# One of each kind of number that is recorded.
counts() {
    count usage /sbin/arrayctl help
    count status /sbin/arrayctl status 2
    count static_usage /appliance/bench/arrayctl_static help
    count static_status /appliance/bench/arrayctl_static status 2
    runs static_status /appliance/bench/arrayctl_static status 2
    calls status-4 /sbin/arrayctl status 4
    calls status-32 /sbin/arrayctl status 32
}

# each WHAT: of every program of the table.
each() {
    $1 empty /appliance/bench/empty
    $1 empty_static /appliance/bench/empty_static
    $1 usage /sbin/arrayctl help
    $1 static_usage /appliance/bench/arrayctl_static help
    $1 usage_lazy /appliance/bench/arrayctl_lazy help
    $1 minimal /appliance/bench/minimal 2
    $1 minimal_bound /appliance/bench/minimal_bound 2
    $1 minimal_static /appliance/bench/minimal_static 2
    $1 status /sbin/arrayctl status 2
    $1 static_status /appliance/bench/arrayctl_static status 2
    $1 status_lazy /appliance/bench/arrayctl_lazy status 2
    $1 detail /usr/sbin/mdadm --detail /dev/md2
    $1 export /usr/sbin/mdadm --detail --export /dev/md2
    $1 lsblk /usr/bin/lsblk -s /dev/md2
}

# By turns, so that a busy minute of the host meets them all.
programs() {
    each count
    for _ in $(seq "$ROUNDS"); do
        each runs
    done
}

# The large array gives way to one of its first members.
mirror_again() {
    must mdadm --stop /dev/md32
    # shellcheck disable=SC2046
    mirror 32 $(members 3 $((2 + $1 / 4)))
}

growth() {
    for size in 2 4; do
        count "status-$size" /sbin/arrayctl status "$size"
        count "minimal-$size" /appliance/bench/minimal "$size"
    done
    for size in 32 16 8; do
        [ "$size" = 32 ] || mirror_again "$size"
        count "status-$size" /sbin/arrayctl status 32
        count "minimal-$size" /appliance/bench/minimal 32
    done
}

# all_calls KEY COMMAND...: those of everything that it starts, to the end of the last of them.
all_calls() {
    key=$1
    shift
    env -i PATH=/usr/bin strace -f -o /tmp/calls "$@" >/dev/null
    echo "calls $key $(grep -vc -e resumed -e '+++' -e '---' /tmp/calls)"
}

hundredths() {
    tr -d . </proc/uptime | cut -d' ' -f1
}

# timed KEY COMMAND...: milliseconds a run; as it is, since whoever looks on would cost more than a fork.
timed() {
    key=$1
    shift
    begin=$(hundredths)
    for _ in $(seq "$RUNS"); do
        env -i PATH=/usr/bin "$@" >/dev/null
    done
    echo "timed $key $((($(hundredths) - begin) * 10 / RUNS))"
}

# What is more is the launcher's start, and its server to the end.
launcher() {
    for _ in $(seq "$ROUNDS"); do
        timed usage /sbin/arrayctl help
        timed launched_usage /usr/sbin/mdrequests /sbin/arrayctl help
    done
    all_calls usage /sbin/arrayctl help
    all_calls launched_usage /usr/sbin/mdrequests /sbin/arrayctl help
    calls status /sbin/arrayctl status 2
    all_calls launched_status /usr/sbin/mdrequests /sbin/arrayctl status 2
}

RUNS=${2:-1}
ROUNDS=${3:-1}
tables_make
arrays_make
case $1 in
counts | launcher) "$1" ;;
*)
    programs
    growth
    ;;
esac
