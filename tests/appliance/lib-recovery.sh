# SPDX-License-Identifier: MIT
# shellcheck shell=sh
# shellcheck disable=SC2034,SC2046,SC2086,SC2154  # the page's blocks and the cases read what stands here
#
# What the cases share that cut the tool off and type what the page of recovery says. It brings
# lib-setup.sh along.
# shellcheck source-path=SCRIPTDIR source-path=SCRIPTDIR/.. source=lib-setup.sh
. /appliance/lib-setup.sh

PAGE=/appliance/recovery.md
BEHIND=/real
STOCK=/with.
AWAKE=/awake
PID=/tmp/pid
STAYED=/tmp/stayed
RAN=/tmp/ran
ALL='sda sdb sdc sdd'

# Older layouts, with the data partitions that belong to them.
LAYOUT_1='1 63 1574307 fd
2 1574370 787185 fd'
WHOLE_1="$LAYOUT_1
3 2634660 6933596 fd"
LAYOUT_2='1 63 4980087 fd
2 4980150 1044225 fd'
WHOLE_2="$LAYOUT_2
3 6281415 3286841 fd"

# Of machines without RAID: layout, first and length of the system, the swap and the data partition.
PLAIN='1 63 273042 273105 787185 1333332 8234924
2 63 4980087 4980150 1044225 6281415 3286841
3 63 530082 530145 787185 1333332 8234924
5 63 722862 722925 594405 1333332 8234924
6 63 4980087 4980150 4192965 9430155 138101
7 256 4980480 4980736 4194304 9437184 131072
8 2048 4980480 4982528 4194304 9437184 131072'

plain_of() { # LAYOUT
    echo "$PLAIN" | awk -v layout="$1" '$1 == layout { print 1, $2, $3, 83; print 2, $4, $5, 82; print 3, $6, $7, 83 }'
}

# --- the page --------------------------------------------------------------------------------------

# block_of ROW KIND: a fenced block of a row, or, with "-", of the page.
block_of() {
    awk -v row="### Row $1:" -v kind="\`\`\`$2" -v any="$1" '
        /^##/ { inside = index($0, row) == 1 }
        /^```/ { if (open) { open = 0; exit } }
        open { print }
        (inside || any == "-") && $0 == kind { open = 1 }' "$PAGE"
}

# looks_like ROW: what the page says that one sees, byte for byte; "whole" for a machine as it should be.
looks_like() {
    case $1 in
    whole) block_of - 'text whole' ;;
    *) block_of "$1" text ;;
    esac >"$EXPECTED"
    block_of - 'sh look' >/tmp/look
    sh /tmp/look >"$SEEN" 2>/tmp/look.errors
    diff "$EXPECTED" "$SEEN"
}

# row_seen COMMAND data|blank: the row of what one sees behind a reboot, "ended" for a run that had come to
# its end, and nothing for a state that the page does not have.
row_seen() {
    awk -v ran="$1" -v had="$2" -f /appliance/rows.awk
}

# way_back ROW [KIND]: typed as it stands, behind what has to be set.
way_back() {
    kind=${2:-}
    block_of "$1" "sh${kind:+ $kind}" >/tmp/way
    [ -s /tmp/way ] || abort "row $1 has no block"
    {
        block_of - 'sh set'
        cat /tmp/set
        cat /tmp/way
    } >/tmp/typed
    PATH=$AWAKE:$STOCK${kind:-/none}:$PATH sh /tmp/typed >/tmp/typed.out 2>&1
    rm -f /tmp/set
    : >/tmp/set
}

# with NAME=VALUE...: what the next way back has otherwise than the page's example.
with() {
    for line in "$@"; do
        echo "${line%%=*}='${line#*=}'"
    done >/tmp/set
}

# numbers LAYOUT MACHINE: the same, from a line of the page of the layouts.
numbers() {
    set -- $(grep "^| $1 | $2 |" /appliance/layouts.md | sed "s/^| $1 | $2 |//" | tr -d '|')
    [ $# = 8 ] || abort "docs/layouts.md has no such line"
    printf '%s\n' START="$1" SYSTEM="$2" TYPE="$3" SWAP="$5" SWAP_TYPE="$6" DATA="$7" >>/tmp/set
}

# with_disks [DISK...]: and these, or all.
with_disks() {
    [ $# -gt 0 ] || set -- $ALL
    printf '%s\n' "DISKS='$(printf '/dev/%s ' "$@")'" "MEMBERS='$(printf '/dev/%s3 ' $ALL)'" >>/tmp/set
}

# --- cuts ------------------------------------------------------------------------------------------

# Under the names of the programs that change disks lies a script that can stay before or behind the
# real one.
stand_in() {
    mkdir -p "$BEHIND" "${STOCK}stock" "$AWAKE"
    mv /usr/sbin/mdadm /usr/sbin/sfdisk /usr/sbin/lvm "$BEHIND"
    for name in pvs lvremove vgremove pvremove pvcreate vgcreate lvcreate vgs vgchange; do
        ln -s lvm "$BEHIND/$name"
    done
    cat >/tmp/stays <<'SCRIPT'
#!/bin/sh
line="${0##*/} $*"
stay() {
    [ -e "/tmp/stay.$1" ] || return
    read -r pattern <"/tmp/stay.$1"
    # shellcheck disable=SC2254  # a pattern
    case $line in
    $pattern)
        echo "$line" >>/tmp/stayed
        while [ -e "/tmp/stay.$1" ] || [ -e /tmp/stay.on ]; do
            sleep 0.5
        done
        ;;
    esac
}
# Killed before it enters the kernel for the N-th time with this call.
run() {
    if [ -d /tmp/calls ]; then
        echo "$line" >"/tmp/calls/$$.line"
        strace -q -o "/tmp/calls/$$.calls" -e signal=none -e trace=write,pwrite64,ioctl,fsync,fdatasync "$@"
        return
    fi
    pattern=
    [ ! -e /tmp/cut ] || read -r call number pattern </tmp/cut
    # shellcheck disable=SC2254  # a pattern
    case $line in
    $pattern) strace -q -o /dev/null -e signal=none -e trace="$call" -e inject="$call:signal=KILL:when=$number" "$@" ;;
    *) "$@" ;;
    esac
}
stay before
if [ -e /tmp/fails ] && read -r pattern </tmp/fails; then
    # shellcheck disable=SC2254  # a pattern
    case $line in
    $pattern) exit 1 ;;
    esac
fi
run "/real/${0##*/}" "$@"
status=$?
echo "$line" >>/tmp/ran
[ "$status" != 137 ] || echo "$line" >>/tmp/killed
stay behind
exit "$status"
SCRIPT
    chmod +x /tmp/stays
    for name in mdadm sfdisk lvm; do
        cp /tmp/stays "/usr/sbin/$name"
    done
    ln -s /usr/sbin/sfdisk.stock "${STOCK}stock/sfdisk"
    # As arrayctl_awake, for what types the tool's name.
    printf '%s\n' '#!/bin/sh' 'exec strace -q -o /dev/null -e signal=none -e trace=clock_nanosleep \
        -e inject=clock_nanosleep:retval=0 /usr/bin/arrayctl "$@"' >"$AWAKE/arrayctl"
    chmod +x "$AWAKE/arrayctl"
    : >/tmp/set
}

count_of() { # PATTERN FILE
    grep -c -- "$1" "$2"
}

# Many ask for one line of any kind, or for none, and these ask often.
counts() { # COUNT PATTERN FILE
    case $1$2 in
    0*) ;;
    1) [ -s "$3" ] ;;
    *) [ "$(count_of "$2" "$3")" -ge "$1" ] ;;
    esac
}

is_quiet() {
    ! cat /proc/[0-9]*/comm 2>/dev/null | grep -qxE 'arrayctl|mdrequests|mdadm|sfdisk|lvm|pvs|strace|sleep'
}

# starts COMMAND...: the tool in a session of its own, so that all of it can be killed.
starts() {
    : >"$PID"
    : >"$STAYED"
    : >"$RAN"
    setsid sh -c "echo \$\$ >$PID; exec $AWAKE/arrayctl $*" >/tmp/run.out 2>&1 &
    started=$!
    await test -s "$PID"
}

# tree_of PID: it and all that it has started; the tool's children have sessions of their own.
tree_of() {
    cat /proc/[0-9]*/stat 2>/dev/null | awk -v root="$1" '
        { parent[$1] = $4 }
        END {
            found[root]
            do {
                grown = 0
                for (pid in parent)
                    if (parent[pid] in found && !(pid in found)) { found[pid]; grown = 1 }
            } while (grown)
            for (pid in found) print pid
        }'
}

# holds_at before|behind PATTERN COUNT "RAN" RAN_COUNT COMMAND...: the tool runs until that many calls of
# this pattern wait, and that many that contain RAN have ended.
holds_at() {
    place=$1
    pattern=$2
    waiting=$3
    ended=$4
    endings=$5
    shift 5
    rm -f /tmp/stay.*
    echo "$pattern" >"/tmp/stay.$place"
    starts "$@"
    await counts "$waiting" '' "$STAYED"
    await counts "$endings" "$ended" "$RAN"
}

# cut_at ...: the same, and then all of it is killed.
cut_at() {
    holds_at "$@"
    end_all
}

# cut_inside CALL N PATTERN COMMAND...: all of it is killed where a program that the tool has started is about
# to enter the kernel for the N-th time with this call.
cut_inside() {
    echo "$1 $2 $3" >/tmp/cut
    pattern=$3
    shift 3
    holds_at behind "$pattern" 1 '' 0 "$@"
    end_all
    rm -f /tmp/cut
}

# All at once: nobody sees another one end. One that is being started while the others are looked for is
# found the next time, as those who could start more stand still by then.
end_all() {
    cut_off=
    found=$(tree_of "$(cat "$PID")" | sort)
    while [ "$found" != "$cut_off" ]; do
        cut_off=$found
        kill -STOP $cut_off 2>/dev/null
        found=$(tree_of "$(cat "$PID")" | sort)
    done
    kill -9 $cut_off 2>/dev/null
    wait
    rm -f /tmp/stay.*
    await is_quiet
}

# beside COMMAND...: while the tool waits, another run is not held.
beside() {
    mv /tmp/stay.* /tmp/stay.on
    "$@"
}

# goes_on: the one that was held comes to its end.
goes_on() {
    rm -f /tmp/stay.*
    wait "$started"
    held_status=$?
}

# The whole machine stops where it is: nothing is written out, told or ended. The runner is told first, as
# nobody could afterwards; it ends instead of starting anew.
power_goes() {
    echo end
    for port in /sys/class/virtio-ports/*; do
        [ "$(cat "$port/name")" != status ] || echo "exit 0 $(cut -d' ' -f1 /proc/uptime)" >"/dev/${port##*/}"
    done
    echo b >/proc/sysrq-trigger
    sleep 1000000
}

has_volumes() {
    ls -d /sys/block/dm-* >/dev/null 2>&1
}

# with_failing PATTERN COMMAND...: each call of this pattern ends with 1 and does nothing.
with_failing() {
    echo "$1" >/tmp/fails
    shift
    "$@"
    ended=$?
    rm /tmp/fails
    return "$ended"
}

# What the page shows, in a file.
seen() {
    sh /tmp/look >"$SEEN" 2>/dev/null
    echo "$SEEN"
}

# The driver and LVM have forgotten all, as after a reboot.
forget() {
    if has_volumes; then
        for group in $(vgs --noheadings -o vg_name 2>/dev/null); do
            must vgchange -q -an "$group"
        done
    fi
    for number in $(arrays_known); do
        stop_arrays "$number"
    done
    for disk in $ALL; do
        read_table_again "$disk"
    done
}

# --- machines --------------------------------------------------------------------------------------

# erased DISK...: nothing on them, and nothing that comes back with partitions in the same places.
erased() {
    for disk in "$@"; do
        for part in 1 2 3; do
            [ ! -e "/dev/$disk$part" ] || mdadm -q --zero-superblock "/dev/$disk$part" 2>/dev/null
        done
        must dd if=/dev/zero of="/dev/$disk" bs=64k count=1 conv=fsync
        read_table_again "$disk"
    done
}

# with_partitions TABLE: disks that were in a machine, with nothing on them.
with_partitions() {
    forget
    erased $ALL
    for disk in $ALL; do
        lay_out "$disk" "$1"
        must mdadm -q --zero-superblock "/dev/${disk}1" "/dev/${disk}2" "/dev/${disk}3"
    done
}

with_system_arrays() {
    array 0 '-e 0.9 -l 1 --force' $(printf '%s1 ' $ALL)
    array 1 '-e 0.9 -l 1 --force' $(printf '%s2 ' $ALL)
    settle 0 1
    stop_arrays 0 1
}

# places_of TABLE: "FIRST COUNT" in bytes, of all that a run changes: the table, the superblocks, and what LVM
# writes in front of its volumes. The data behind that stays what it was, and is what is compared.
places_of() {
    echo "$1" | awk '
        BEGIN { print 0, 65536 }
        $1 < 3 { printf "%.0f %d\n", ($2 + $3) * 512 - 131072, 131072 }
        $1 == 3 { printf "%.0f %d\n", $2 * 512, 8388608 }'
}

# keep NAME TABLE: takes a picture of the disks.
keep() {
    mkdir -p "/tmp/kept.$1"
    places_of "$2" >"/tmp/kept.$1/places"
    sync
    for disk in $ALL; do
        must blockdev --flushbufs "/dev/$disk"
        while read -r first count; do
            dd if="/dev/$disk" of="/tmp/kept.$1/$disk.$first" bs=64k iflag=skip_bytes,count_bytes \
                skip="$first" count="$count" 2>/dev/null
        done <"/tmp/kept.$1/places"
    done
}

# put_back NAME: the machine is again as it was, and switched off.
put_back() {
    forget
    for disk in $ALL; do
        while read -r first _; do
            dd if="/tmp/kept.$1/$disk.$first" of="/dev/$disk" bs=64k oflag=seek_bytes seek="$first" \
                conv=notrunc,fsync 2>/dev/null
        done <"/tmp/kept.$1/places"
        read_table_again "$disk"
    done
}

data_members() {
    printf '%s3 ' $ALL
}

# What newvol would give that many disks.
data_level() {
    [ "$(echo $ALL | wc -w)" -gt 2 ] && echo 5 || echo 1
}

# with_data TABLE: a machine in order that has been switched off, and what is on its array.
with_data() {
    name=$(echo "$1 $ALL" | md5sum | cut -c1-8)
    if [ ! -d "/tmp/kept.$name" ]; then
        with_partitions "$1"
        with_system_arrays
        make_array 2 -l "$(data_level)" -n "$(echo $ALL | wc -w)" --force --assume-clean --size=16384 \
            $(nodes $(data_members))
        store_data md2
        repair 2
        settle 2
        picture md2 >"/tmp/before.$name"
        stop_arrays 2
        keep "$name" "$1"
    fi
    put_back "$name"
    cp "/tmp/before.$name" /tmp/before
}

# lose_system TABLE: row 1 on all disks.
lose_system() {
    with_data "$1"
    cut_at before 'sfdisk -N1 *' "$(echo $ALL | wc -w)" '' 0 initsys
    forget
    block_of - 'sh look' >/tmp/look
    check 'partition 3 alone' [ "$(sh /tmp/look | grep -c '^sd. 3:md2$')" = "$(echo $ALL | wc -w)" ]
}

# with_volume: the same with a volume on an array that newvol has made; the array runs.
with_volume() {
    if [ ! -d /tmp/kept.volume ]; then
        with_partitions "$WHOLE_8"
        with_system_arrays
        must arrayctl newvol
        at_full_speed 2
        await mdadm_state_is 2 clean
        must wipefs -q -a /dev/md2
        make_group vg1 2
        make_volume vg1 volume 100%FREE
        store_data vg1/volume
        picture vg1/volume >/tmp/before.volume
        forget
        keep volume "$WHOLE_8"
    fi
    put_back volume
    must assembles
    must vgchange -q -ay vg1
    must dmsetup mknodes
    cp /tmp/before.volume /tmp/before
}

check_volume() {
    must dmsetup mknodes
    picture vg1/volume >/tmp/now
    check 'every byte of it' cmp /tmp/before /tmp/now
    check 'its files' data_is_whole vg1/volume
    check 'the parity below' parity_is_right 2
}

# Those that carry a superblock.
members_left() {
    for disk in $ALL; do
        ! mdadm -E "/dev/${disk}3" >/dev/null 2>&1 || printf '%s ' "/dev/${disk}3"
    done
}

# Whatever the speed of the others.
at_full_speed() {
    echo 1000000 >"/sys/block/md$1/md/sync_speed_max"
    echo 1000000 >"/sys/block/md$1/md/sync_speed_min"
}

# The parity is that of the data from now on.
repair() {
    at_full_speed "$1"
    echo repair >"/sys/block/md$1/md/sync_action"
    await grep -qx idle "/sys/block/md$1/md/sync_action"
}

parity_is_right() {
    [ "$(cat "/sys/block/md$1/md/degraded")" = 0 ] || return 1
    # Arrays on the same disks wait for one another.
    for action in /sys/block/md[01]/md/sync_action; do
        [ ! -e "$action" ] || echo frozen >"$action"
    done
    at_full_speed "$1"
    echo check >"/sys/block/md$1/md/sync_action"
    comes grep -qx idle "/sys/block/md$1/md/sync_action" &&
        [ "$(cat "/sys/block/md$1/md/mismatch_cnt")" = 0 ]
}

# check_data: the array runs, not a byte of it is another one, and its parity is right.
check_data() {
    check 'the data array' array_is 2 "raid$(data_level)" 1.2 $(data_members)
    picture md2 >/tmp/now
    check 'every byte of it' cmp /tmp/before /tmp/now
    check 'its files' data_is_whole md2
    check 'its parity' parity_is_right 2
}

assembles() {
    mdadm -A -R /dev/md2 $(nodes $(data_members))
}

# check_found SECTOR: what the page finds without a partition is where the data begins.
check_found() {
    block_of - 'sh begin' >/tmp/begin
    check 'where it begins' [ "$(sh /tmp/begin)" = "$1" ]
}

# check_way_back TABLE: the data is back, where it was.
check_way_back() {
    check_tables "$1" $ALL
    [ -e /sys/block/md2 ] || check 'assembles' assembles
    check_data
    forget
}

# check_whole TABLE: the way back has ended in a machine in order.
check_whole() {
    check_tables "$1" $ALL
    check 'system arrays' system_arrays_are $ALL
    check 'assembles' assembles
    check_data
    stop_arrays 0 1 2
    check 'looks like it' looks_like whole
}
