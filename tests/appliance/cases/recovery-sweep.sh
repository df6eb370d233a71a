#!/bin/sh
# SPDX-License-Identifier: MIT
# The tool is cut off before and behind each of the commands that it runs, on the first, the middle and the
# last disk, inside the partitioner and mdadm, between what they ask of the kernel, and at random moments:
# every state is a row of the page of recovery.
# alone: yes
# disks: 3
# size: 4672M
# shellcheck disable=SC2046,SC2086,SC2154,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-recovery.sh
. /appliance/lib-recovery.sh
ALL='sda sdb sdc'
RANDOM_CUTS=15
ALL_CUTS=300
plan 5

begin_initsys_data() {
    with_data "$WHOLE_8"
}

begin_initsys_blank() {
    put_back blank
}

begin_newvol_data() {
    with_data "$WHOLE_8"
}

begin_destroy_data() {
    with_volume
}

# named COMMAND data|blank: a row of the page, and the superblocks of the data that it speaks of.
named() {
    forget
    sh /tmp/look >"$SEEN" 2>/dev/null
    row=$(row_seen "$1" "$2" <"$SEEN")
    echo "$1 $2: $row" >>/tmp/rows
    case $row in
    'row '*)
        grep -q "^### Row ${row#row }:" "$PAGE" && return
        ;;
    ended) return ;;
    esac
    cat "$SEEN"
    return 1
}

now() { # hundredths of a second
    tr -d . </proc/uptime | cut -d' ' -f1
}

# The commands among them, and no questions.
that_change() {
    grep -v '^pvs\|^mdadm -[DE]\|^sfdisk -l' "$1"
}

# whole_run COMMAND data|blank
whole_run() {
    "begin_$1_$2"
    begin=$(now)
    run_through "$1"
    echo $(($(now) - begin + 1)) >/tmp/length
}

run_through() { # COMMAND
    rm -f /tmp/stay.*
    starts $(words_of "$1")
    wait
    await is_quiet
}

# "CALL N COMMAND LINE" for all that the partitioner and mdadm have the kernel change.
calls_of() { # COMMAND data|blank
    "begin_$1_$2"
    mkdir /tmp/calls
    run_through "$1"
    for line in /tmp/calls/*.line; do
        that_change "$line" | grep '^sfdisk\|^mdadm' >/tmp/line || continue
        awk -v line="$(cat /tmp/line)" '/^[a-z0-9_]*\(/ {
            call = substr($0, 1, index($0, "(") - 1)
            count[call]++
            changes = /BLKPG/ && line ~ /^sfdisk/ || /_ARRAY|_DISK/ && !/GET_/
            if (call != "ioctl" || changes) print call, count[call], line
        }' "${line%.line}.calls"
    done
    rm -rf /tmp/calls
}

words_of() {
    [ "$1" = destroy ] && echo 'destroy 2' || echo "$1"
}

# Nobody takes it for one that hangs.
count_cut() {
    cuts=$((cuts + 1))
    echo "cut $cuts: $1 $2, $row"
}

# around COMMAND data|blank: before and behind each command.
around() {
    whole_run "$1" "$2"
    that_change "$RAN" | sort -u >/tmp/commands
    while read -r line <&3; do
        for place in before behind; do
            "begin_$1_$2"
            cut_at "$place" "$line" 1 '' 0 $(words_of "$1")
            check "cut $place $line" named "$1" "$2"
            count_cut "$1" "$2"
        done
    done 3</tmp/commands
}

# inside CUTS COMMAND data|blank: where a program is about to change something, or has just done so.
inside() {
    count=$1
    shift
    calls_of "$1" "$2" | shuf -n "$count" >/tmp/points
    : >/tmp/killed
    while read -r call number line <&3; do
        "begin_$1_$2"
        cut_inside "$call" "$number" "$line" $(words_of "$1")
        check "cut at $call $number of $line" named "$1" "$2"
        count_cut "$1" "$2"
    done 3</tmp/points
    # What a program asks differs a little from run to run.
    check 'they were killed' [ $(($(wc -l </tmp/killed) * 3)) -ge $(($(wc -l </tmp/points) * 2)) ]
}

# at_random CUTS COMMAND data|blank
at_random() {
    count=$1
    shift
    length=$(cat /tmp/length)
    for _ in $(seq "$count"); do
        "begin_$1_$2"
        moment=$(($(od -An -N2 -tu2 /dev/urandom) % length))
        starts $(words_of "$1")
        usleep $((moment * 10000))
        end_all
        check 'cut at a random moment' named "$1" "$2"
        count_cut "$1" "$2"
    done
}

# sweep COMMAND data|blank INSIDE
sweep() {
    around "$1" "$2"
    at_random "$RANDOM_CUTS" "$1" "$2"
    inside "$3" "$1" "$2"
    verdict "every cut of $1, $2, ends in a row of the page"
}

# Which disks would be wiped follows from their partitions, and takes the tool's time.
block_of - 'sh look' | sed '/^echo format:/d' >/tmp/look
slow_resync
bays 0x7
stand_in
keep blank "$WHOLE_8"

cuts=0
: >/tmp/rows
sweep initsys data 45
sweep initsys blank 25
sweep destroy data 80
sweep newvol data 80
# How much a program asks of the kernel is not the same everywhere.
[ "$cuts" -ge "$ALL_CUTS" ] || at_random $((ALL_CUTS - cuts)) newvol data

sort /tmp/rows | uniq -c
check 'all states were looked at' [ "$(wc -l </tmp/rows)" = "$cuts" ]
check 'so many' [ "$cuts" -ge "$ALL_CUTS" ]
verdict "$cuts cuts: nothing is unnamed"
finish
