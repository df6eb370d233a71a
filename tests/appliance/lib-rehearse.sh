# SPDX-License-Identifier: MIT
# shellcheck shell=sh
# shellcheck disable=SC2046,SC2086,SC2154  # lists of words; lib-setup.sh sets what is read here
#
# What the cases share that rehearse. It brings lib-setup.sh along.
# shellcheck source-path=SCRIPTDIR source-path=SCRIPTDIR/.. source=lib-setup.sh
. /appliance/lib-setup.sh

REAL=/real
CALLS=/tmp/calls
REHEARSED=/tmp/rehearsed
TOLD=/tmp/told

# --- what the real tool runs ----------------------------------------------------------------------

has_lvm() {
    [ -e /usr/sbin/lvm ]
}

# Under the names of all programs lies a script that writes down how it is called, as a person would
# type it, and passes that on.
record_calls() {
    mkdir -p "$REAL"
    programs='/usr/sbin/mdadm /usr/sbin/sfdisk /usr/bin/umount'
    ! has_lvm || programs="$programs /usr/sbin/lvm"
    mv $programs "$REAL"
    for name in pvs lvremove vgremove pvremove pvcreate vgcreate lvcreate vgs vgchange vgextend; do
        ln -s lvm "$REAL/$name"
    done
    cat >/tmp/recorder <<'SCRIPT'
#!/bin/sh
line=$0
for word in "$@"; do
    [ -n "$word" ] || word="''"
    line="$line $word"
done
echo "$line" >>/tmp/calls
exec "/real/${0##*/}" "$@"
SCRIPT
    chmod +x /tmp/recorder
    for program in $programs; do
        cp /tmp/recorder "$program"
    done
}

# The commands among the calls: what is no question, be it the tool's or, where there is one, udev's.
calls_that_change() {
    grep -v -e '^/sbin/mdadm --detail ' -e '^/sbin/mdadm -E ' -e '^/sbin/sfdisk -l ' -e '^/sbin/pvs -o ' "$CALLS"
}

# Children work side by side, so the commands of each disk are compared in their order; those of the
# whole machine name no disk, or several.
in_order() {
    for disk in sda sdb sdc sdd; do
        echo "# $disk"
        grep -E "/dev/${disk}[0-9]*\$" "$1"
    done
    echo '# all'
    grep -v -E '^[^ ]* [^ ]* [^ ]*/dev/sd[a-d][0-9]*$|^/sbin/sfdisk ' "$1"
}

# --- that nothing has changed ---------------------------------------------------------------------

# What is mounted is flushed by each "sync", so writes are counted by their sectors. Udev's workers
# come and go by themselves, and tidy up which of them claimed a link.
state() {
    writes | awk '{ print $1, $3, $4 }'
    cat /proc/mdstat /proc/mounts
    "$REAL/lvm" vgs --noheadings -o vg_name,lv_count 2>/dev/null
    find /tmp /run /var/log /etc /dev ! -path "$SYSLOG" ! -path '/tmp/*' ! -path '/run/udev/links/*' \
        2>/dev/null | sort
    find /tmp -name '.*' | sort
    log_is_whole
    grep -v ' mark: ' "$SYSLOG"
    for process in /proc/[0-9]*; do
        [ ! -e "$process/exe" ] || readlink "$process/exe"
    done | sort | uniq -c | grep -v -e busybox -e systemd-udevd
}

# keeps_everything COMMAND...: before and behind it, all of this is the same.
keeps_everything() {
    state >/tmp/state
    "$@"
    kept=$?
    state >/tmp/state.now
    diff /tmp/state /tmp/state.now || return 125
    return "$kept"
}

# Every sector of every disk, a line for each. Only a case whose head says "pictures: yes" can ask for it.
exec 3>&1
host_picture() {
    sync
    for port in /sys/class/virtio-ports/*; do
        [ "$(cat "$port/name")" = answers ] || continue
        echo picture >&3
        while read -r line && [ "$line" != end ]; do
            echo "$line"
        done <"/dev/${port##*/}"
    done
}

# keeps_every_sector STATUS COMMAND...: rehearsed, with every sector of every disk as before.
keeps_every_sector() {
    host_picture >/tmp/picture
    rehearses "$@" || return 1
    host_picture >/tmp/picture.now
    [ "$(grep -c '^disk' /tmp/picture)" = 4 ] && diff /tmp/picture /tmp/picture.now
}

# --- the rehearsal --------------------------------------------------------------------------------

# rehearses STATUS COMMAND...: it ends with this status, and has left everything as it was.
rehearses() {
    expected=$1
    shift
    keeps_everything arrayctl-rehearse "$@" >"$TOLD" 2>/tmp/told.errors
    told=$?
    [ "$told" = "$expected" ] && return
    echo "expected status $expected, seen $told"
    cat "$TOLD" /tmp/told.errors
    return 1
}

# lists STATUS COMMAND...: the same, with the commands alone.
lists() {
    expected=$1
    shift
    rehearses "$expected" --commands "$@" && cp "$TOLD" "$REHEARSED"
}

# comes_true COMMAND...: the real run has just ended; these were the commands.
comes_true() {
    calls_that_change >/tmp/changes
    in_order "$REHEARSED" >/tmp/rehearsed.order
    in_order /tmp/changes >/tmp/changes.order
    [ "$(wc -l <"$REHEARSED")" = "$(wc -l </tmp/changes)" ] &&
        diff /tmp/rehearsed.order /tmp/changes.order
}

# tells LINE: a whole line of the last rehearsal, without the blanks before it.
tells() {
    sed 's/^ *//' "$TOLD" | grep -qxF -- "$1" && return
    cat "$TOLD"
    return 1
}

# warns "COMMAND" LINE...: the rehearsal ends with 3, and each of these is one of its lines.
warns() {
    # shellcheck disable=SC2086  # a list of words
    arrayctl-rehearse $1 >"$TOLD" 2>/tmp/told.errors
    told=$?
    shift
    [ "$told" = 3 ] || {
        echo "status $told"
        cat "$TOLD" /tmp/told.errors
        return 1
    }
    for line in "$@"; do
        tells "$line" || return 1
    done
}
