# SPDX-License-Identifier: MIT
# shellcheck shell=bash
#
# The part of the appliance that does not change from run to run: a stock kernel, its modules and
# the stock programs. It is made once and kept in the cache folder; a run adds only what was built.

# shellcheck source=SCRIPTDIR/fetch.sh
. "$APPLIANCE_DIR/lib/fetch.sh"

# What the machine loads at its start, and what the kernel asks for when it is needed.
KERNEL_MODULES=(
    virtio_pci virtio_console virtio_scsi sd_mod
    md_mod linear raid0 raid1 raid10 raid456 multipath
    dm_mod dm_snapshot dm_mirror
    ext4 crc32c_generic loop scsi_debug
)

# Program, and where it lies inside. The stock partitioner makes room for the appliance's own.
GUEST_TOOLS=(
    mdadm:/usr/sbin/mdadm
    lvm:/usr/sbin/lvm
    dmsetup:/usr/sbin/dmsetup
    blkid:/usr/sbin/blkid
    wipefs:/usr/sbin/wipefs
    blockdev:/usr/sbin/blockdev
    lsblk:/usr/bin/lsblk
    findmnt:/usr/bin/findmnt
    flock:/usr/bin/flock
    mount:/usr/bin/mount
    umount:/usr/bin/umount
    mke2fs:/usr/sbin/mkfs.ext4
    e2fsck:/usr/sbin/e2fsck
    debugfs:/usr/sbin/debugfs
)
# The cases of the suites want these too; without them the demo still runs.
CASE_TOOLS=(sfdisk:/usr/sbin/sfdisk.stock strace:/usr/bin/strace)

# With udev, as on every stock machine: Debian's own rules for what this machine has.
UDEV_TOOLS=(udevadm:/usr/bin/udevadm udevadm:/usr/lib/systemd/systemd-udevd scsi_id:/usr/lib/udev/scsi_id)
UDEV_RULES=(
    01-md-raid-creating 50-udev-default 55-dm 56-lvm 60-block 60-persistent-storage
    60-persistent-storage-dm 63-md-raid-arrays 64-md-raid-assembly 69-lvm 95-dm-notify
)

LVM_COMMANDS=(
    pvs pvcreate pvremove pvscan pvck vgs vgcreate vgremove vgchange vgscan vgextend
    lvs lvcreate lvremove lvchange lvscan
)

PROGRAM_FOLDERS=(usr/sbin usr/bin sbin bin usr/lib/udev lib/udev)
RULE_FOLDERS=(usr/lib/udev/rules.d lib/udev/rules.d)
LIBRARY_FOLDERS=(
    usr/lib/x86_64-linux-gnu lib/x86_64-linux-gnu usr/lib/x86_64-linux-gnu/systemd usr/lib64 lib64 usr/lib lib
)

GUEST_FOLDERS=(
    usr/bin usr/sbin usr/lib usr/lib64 dev proc sys etc/lvm etc/mdadm etc.defaults run/lock
    tmp root mnt var/log var/run appliance
)

# Changes whenever something in the base would: a package, a program's version, the scripts.
base_key() {
    local -a packages
    mapfile -t packages < <(packages_of inside "$szRelease" appliance udev)
    {
        ls "$1"
        ! is_own_release || dpkg-query -W -f '${Package} ${Version}\n' "${packages[@]}" libc6 2>/dev/null
        cat "${BASH_SOURCE[0]}" "$APPLIANCE_DIR/lib/fetch.sh"
    } | sha256sum | cut -c1-16
}

# A kernel's package comes without the list of what needs what; installing it would make one.
base_modules() {
    local szUnpacked=$1 szRoot=$2 szVersion szModule szPath
    # Releases differ in where the modules lie; both ways lead to them.
    [ -e "$szUnpacked/lib/modules" ] || {
        mkdir -p "$szUnpacked/lib" && ln -s ../usr/lib/modules "$szUnpacked/lib/modules" || return
    }
    szVersion=$(basename "$szUnpacked"/lib/modules/*)
    depmod -b "$szUnpacked" "$szVersion" || return
    for szModule in "${KERNEL_MODULES[@]}"; do
        # Not every kernel has every one.
        modprobe -d "$szUnpacked" -S "$szVersion" --show-depends "$szModule" 2>/dev/null
    done | sed -n 's/^insmod \([^ ]*\).*/\1/p' | sort -u | while read -r szPath; do
        install -D -m 644 "$szPath" "$szRoot/usr/lib/modules/${szPath#*/lib/modules/}" || exit
    done || return
    cp "$szUnpacked/lib/modules/$szVersion"/modules.{order,builtin,builtin.modinfo} \
        "$szRoot/usr/lib/modules/$szVersion/" && depmod -b "$szRoot/usr" "$szVersion"
}

# inside_find UNPACKED NAME FOLDER...: where a file lies among what was fetched, or on this machine.
inside_find() {
    local szUnpacked=$1 szName=$2 szPlace szFolder
    shift 2
    for szPlace in "$szUnpacked" ''; do
        [ -n "$szPlace" ] || is_own_release || continue
        for szFolder in "$@"; do
            [ ! -f "$szPlace/$szFolder/$szName" ] || { printf '%s\n' "$szPlace/$szFolder/$szName"; return; }
        done
    done
    return 1
}

# inside_install UNPACKED FILE TARGET ROOT: a program or library, and every library that it needs.
inside_install() {
    local szUnpacked=$1 szFile=$2 szRoot=$4 szLibrary szPath
    install -D "$szFile" "$szRoot$3" || return
    while read -r szLibrary; do
        szPath=/usr/lib/x86_64-linux-gnu/$szLibrary
        [[ $szLibrary != ld-linux* ]] || szPath=/usr/lib64/$szLibrary
        [ ! -e "$szRoot$szPath" ] || continue
        szFile=$(inside_find "$szUnpacked" "$szLibrary" "${LIBRARY_FOLDERS[@]}") ||
            { complain "no $szLibrary for $3"; return 1; }
        inside_install "$szUnpacked" "$szFile" "$szPath" "$szRoot" || return
    done < <(readelf -dl "$szFile" | sed -n -e 's/.*(NEEDED).*\[\(.*\)\]/\1/p' \
        -e 's,.*program interpreter: .*/\(.*\)\],\1,p')
}

base_programs() {
    local szUnpacked=$1 szRoot=$2 szPair szCommand szApplet
    for szPair in "${GUEST_TOOLS[@]}" "${CASE_TOOLS[@]}"; do
        szCommand=$(inside_find "$szUnpacked" "${szPair%%:*}" "${PROGRAM_FOLDERS[@]}") || {
            [[ " ${CASE_TOOLS[*]} " == *" $szPair "* ]] && continue
            complain "no ${szPair%%:*} for the inside"
            return 1
        }
        inside_install "$szUnpacked" "$szCommand" "${szPair#*:}" "$szRoot" || return
    done
    for szCommand in "${LVM_COMMANDS[@]}"; do
        ln -s lvm "$szRoot/usr/sbin/$szCommand" || return
    done
    szCommand=$(inside_find "$szUnpacked" busybox "${PROGRAM_FOLDERS[@]}") &&
        install "$szCommand" "$szRoot/usr/bin/busybox" || return
    while read -r szApplet; do
        szApplet=$szRoot/usr/${szApplet#usr/}
        [ -e "$szApplet" ] || ln -s /usr/bin/busybox "$szApplet" || return
    done < <("$szCommand" --list-full | grep -v '^linuxrc$')
}

base_udev() {
    local szUnpacked=$1 szRoot=$2 szPair szRule szFile
    for szPair in "${UDEV_TOOLS[@]}"; do
        szFile=$(inside_find "$szUnpacked" "${szPair%%:*}" "${PROGRAM_FOLDERS[@]}") ||
            { complain "no ${szPair%%:*} for the inside"; return 1; }
        inside_install "$szUnpacked" "$szFile" "${szPair#*:}" "$szRoot" || return
    done
    for szRule in "${UDEV_RULES[@]}"; do
        szFile=$(inside_find "$szUnpacked" "$szRule.rules" "${RULE_FOLDERS[@]}") ||
            { complain "no rules $szRule for the inside"; return 1; }
        install -D -m 644 "$szFile" "$szRoot/usr/lib/udev/rules.d/$szRule.rules" || return
    done
}

base_root() {
    local szRoot=$1 szFolder
    for szFolder in "${GUEST_FOLDERS[@]}"; do
        mkdir -p "$szRoot/$szFolder"
    done
    for szFolder in bin sbin lib lib64; do
        ln -s "usr/$szFolder" "$szRoot/$szFolder"
    done
    printf 'root:x:0:0:root:/root:/bin/sh\n' >"$szRoot/etc/passwd"
    printf 'root:x:0:\ndisk:x:6:\n' >"$szRoot/etc/group"
}

base_make() { # FETCHED WORK
    local szDeb szWork=$2
    mkdir "$szWork/unpacked" "$szWork/out" "$szWork/root" || return
    for szDeb in "$1"/*.deb; do
        dpkg -x "$szDeb" "$szWork/unpacked" || return
    done
    base_root "$szWork/root" &&
        base_modules "$szWork/unpacked" "$szWork/root" &&
        base_programs "$szWork/unpacked" "$szWork/root" &&
        { [ "$fUdev" = no ] || base_udev "$szWork/unpacked" "$szWork/root"; } &&
        pack "$szWork/root" "$szWork/out/base.cpio" &&
        cp "$szWork"/unpacked/boot/vmlinuz-* "$szWork/out/vmlinuz" &&
        (cd "$szWork/root" && find usr/lib usr/lib64 -name '*.so*') >"$szWork/out/libraries"
}

# Only what has booted is kept; anything else would fail every run to come.
base_build() { # FETCHED BASE
    local szWork
    note "making the base of the appliance from $(basename "$1"/linux-image-[0-9]*.deb) (once)"
    szWork=$(mktemp -d "$CACHE_DIR/work.XXXXXX")
    if base_make "$1" "$szWork" 2>"$szWork/log" &&
        ARRAYCTL_BASE=$szWork/out ARRAYCTL_RELEASE=$szRelease ARRAYCTL_UDEV=$fUdev "$APPLIANCE_DIR/run" --quiet --build none --disks 1 "$APPLIANCE_DIR/guest/trial" >>"$szWork/log" 2>&1; then
        mv "$szWork/out" "$2"
        rm -rf "$szWork"
        return
    fi
    complain "the base of the appliance cannot be made:"
    cat "$szWork/log" >&2
    rm -rf "$szWork"
    exit "$EXIT_MACHINE"
}

# Prints the folder that holds vmlinuz and base.cpio, made first when it is not there. Runs may
# start at the same time: one of them makes it, the others wait.
base_ready() {
    local szFetched szBase szKind=$szRelease
    [ "$fUdev" = no ] || szKind+=-udev
    [ -z "${ARRAYCTL_BASE:-}" ] || { printf '%s\n' "$ARRAYCTL_BASE"; return; }
    mkdir -p "$CACHE_DIR"
    exec 9>"$CACHE_DIR/lock-$szRelease"
    flock 9
    szFetched=$(fetch_packages) || exit
    szBase=$CACHE_DIR/base-$szKind-$(base_key "$szFetched")
    [ -e "$szBase/vmlinuz" ] || base_build "$szFetched" "$szBase"
    exec 9>&-
    printf '%s\n' "$szBase"
}
