#!/bin/sh
# SPDX-License-Identifier: MIT
# The tool is cut off before and behind each of the commands that it runs, on the first, a middle and the
# last disk, and at random moments: every state is a row of the page of recovery.
# alone: yes
# disks: 4
# size: 4672M
# shellcheck disable=SC2046,SC2086,SC2154,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-recovery.sh
. /appliance/lib-recovery.sh
RANDOM_CUTS=60
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

# The commands of a whole run, those of a disk on the first, a middle and the last one.
commands_of() { # COMMAND data|blank
    "begin_$1_$2"
    rm -f /tmp/stay.*
    begin=$(now)
    starts $(words_of "$1")
    wait
    echo $(($(now) - begin + 1)) >/tmp/length
    await is_quiet
    grep -v '/dev/sdc[0-9]*$' "$RAN" | grep -v '^pvs\|^mdadm -D' | sort -u
}

words_of() {
    [ "$1" = destroy ] && echo 'destroy 2' || echo "$1"
}

# Nobody takes it for one that hangs.
count_cut() {
    cuts=$((cuts + 1))
    echo "$cuts cuts by now"
}

# sweep COMMAND data|blank
sweep() {
    commands_of "$1" "$2" >"/tmp/commands.$1.$2"
    while read -r line <&3; do
        for place in before behind; do
            "begin_$1_$2"
            cut_at "$place" "$line" 1 '' 0 $(words_of "$1")
            check "cut $place $line" named "$1" "$2"
            count_cut
        done
    done 3<"/tmp/commands.$1.$2"
    length=$(cat /tmp/length)
    for _ in $(seq "$RANDOM_CUTS"); do
        "begin_$1_$2"
        moment=$(($(od -An -N2 -tu2 /dev/urandom) % length))
        starts $(words_of "$1")
        usleep $((moment * 10000))
        end_all
        check "cut at a random moment" named "$1" "$2"
        count_cut
    done
    verdict "every cut of $1, $2, ends in a row of the page"
}

block_of - 'sh look' >/tmp/look
slow_resync
bays 0xf
stand_in
keep blank "$WHOLE_8"

cuts=0
: >/tmp/rows
sweep initsys data
sweep initsys blank
sweep newvol data
sweep destroy data

sort /tmp/rows | uniq -c
check 'all states were looked at' [ "$(wc -l </tmp/rows)" = "$cuts" ]
check 'so many' [ "$cuts" -ge 300 ]
verdict "$cuts cuts: nothing is unnamed"
finish
