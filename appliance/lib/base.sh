# SPDX-License-Identifier: MIT
# shellcheck shell=bash
#
# The part of the appliance that does not change from run to run: a stock kernel, its modules and
# the stock programs. It is made once and kept in the cache folder; a run adds only what was built.

KERNEL_META_PACKAGE=linux-image-cloud-amd64
KERNEL_DEB_PATTERN='linux-image-*-cloud-amd64_*.deb'

# What the machine loads at its start, and what the kernel asks for when it is needed.
KERNEL_MODULES=(
    virtio_pci virtio_console virtio_scsi sd_mod
    md_mod linear raid0 raid1 raid10 raid456 multipath
    dm_mod dm_snapshot dm_mirror
    ext4 crc32c_generic loop scsi_debug
)

# Program of the host, and where it lies inside. The stock partitioner makes room for the
# appliance's own.
GUEST_TOOLS=(
    mdadm:/usr/sbin/mdadm
    lvm:/usr/sbin/lvm
    dmsetup:/usr/sbin/dmsetup
    sfdisk:/usr/sbin/sfdisk.stock
    blkid:/usr/sbin/blkid
    wipefs:/usr/sbin/wipefs
    blockdev:/usr/sbin/blockdev
    lsblk:/usr/bin/lsblk
    findmnt:/usr/bin/findmnt
    flock:/usr/bin/flock
    mount:/usr/bin/mount
    umount:/usr/bin/umount
    strace:/usr/bin/strace
    mke2fs:/usr/sbin/mkfs.ext4
    e2fsck:/usr/sbin/e2fsck
    debugfs:/usr/sbin/debugfs
)

LVM_COMMANDS=(
    pvs pvcreate pvremove pvscan pvck vgs vgcreate vgremove vgchange vgscan vgextend
    lvs lvcreate lvremove lvchange lvscan
)

BASE_PACKAGES=(busybox-static mdadm lvm2 dmsetup fdisk util-linux mount e2fsprogs strace libc6)

GUEST_FOLDERS=(
    usr/bin usr/sbin usr/lib usr/lib64 dev proc sys etc/lvm etc/mdadm etc.defaults run/lock
    tmp root mnt var/log var/run appliance
)

# Prints the path of the kernel package, fetched when the cache has none.
kernel_package() {
    local szDeb szPackage
    szDeb=$(kernel_package_cached)
    if [ -z "$szDeb" ]; then
        szPackage=$(apt-cache depends --important "$KERNEL_META_PACKAGE" 2>/dev/null |
            sed -n 's/^ *Depends: \(linux-image-[0-9].*\)/\1/p')
        [ -n "$szPackage" ] || die "$KERNEL_META_PACKAGE is not known here; run apt-get update"
        note "fetching $szPackage (27 MB, once)"
        (cd "$CACHE_DIR" && apt-get -q -o APT::Sandbox::User=root download "$szPackage") \
            >"$CACHE_DIR/download.log" 2>&1 || die "no kernel: $(tail -n 1 "$CACHE_DIR/download.log")"
        szDeb=$(kernel_package_cached)
    fi
    printf '%s\n' "$szDeb"
}

kernel_package_cached() {
    find "$CACHE_DIR" -maxdepth 1 -name "$KERNEL_DEB_PATTERN" | sort -V | tail -n 1
}

# Changes whenever something in the base would: the kernel, a program's version, this file.
base_key() {
    {
        basename "$1"
        dpkg-query -W -f '${Package} ${Version}\n' "${BASE_PACKAGES[@]}"
        cat "${BASH_SOURCE[0]}"
    } | sha256sum | cut -c1-16
}

base_modules() {
    local szUnpacked=$1 szRoot=$2 szVersion szModule szPath
    szVersion=$(basename "$szUnpacked"/lib/modules/*)
    # The package comes without the dependency list; installing it would make one.
    depmod -b "$szUnpacked" "$szVersion"
    for szModule in "${KERNEL_MODULES[@]}"; do
        modprobe -d "$szUnpacked" -S "$szVersion" --show-depends "$szModule" 2>/dev/null
    done | sed -n 's/^insmod \([^ ]*\).*/\1/p' | sort -u | while read -r szPath; do
        install -D -m 644 "$szPath" "$szRoot/usr${szPath#"$szUnpacked"}"
    done
    cp "$szUnpacked/lib/modules/$szVersion"/modules.{order,builtin,builtin.modinfo} \
        "$szRoot/usr/lib/modules/$szVersion/"
    depmod -b "$szRoot/usr" "$szVersion"
}

base_programs() {
    local szRoot=$1 szPair szCommand szApplet
    for szPair in "${GUEST_TOOLS[@]}"; do
        szCommand=$(command -v "${szPair%%:*}") || die "${szPair%%:*} is missing on this machine"
        copy_with_libraries "$szCommand" "${szPair#*:}" "$szRoot"
    done
    for szCommand in "${LVM_COMMANDS[@]}"; do
        ln -s lvm "$szRoot/usr/sbin/$szCommand"
    done
    install "$(command -v busybox)" "$szRoot/usr/bin/busybox"
    while read -r szApplet; do
        szApplet=$szRoot/usr/${szApplet#usr/}
        [ -e "$szApplet" ] || ln -s /usr/bin/busybox "$szApplet"
    done < <(busybox --list-full | grep -v '^linuxrc$')
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

base_build() {
    local szDeb=$1 szBase=$2 szWork
    note "making the base of the appliance from $(basename "$szDeb") (once)"
    szWork=$(mktemp -d "$CACHE_DIR/work.XXXXXX")
    mkdir "$szWork/out" "$szWork/root"
    dpkg -x "$szDeb" "$szWork/kernel"
    base_root "$szWork/root"
    base_modules "$szWork/kernel" "$szWork/root"
    base_programs "$szWork/root"
    pack "$szWork/root" "$szWork/out/base.cpio"
    cp "$szWork"/kernel/boot/vmlinuz-* "$szWork/out/vmlinuz"
    mv "$szWork/out" "$szBase"
    rm -rf "$szWork"
}

# Prints the folder that holds vmlinuz and base.cpio, made first when it is not there. Runs may
# start at the same time: one of them makes it, the others wait.
base_ready() {
    local szDeb szBase
    mkdir -p "$CACHE_DIR"
    exec 9>"$CACHE_DIR/lock"
    flock 9
    szDeb=$(kernel_package) || exit
    szBase=$CACHE_DIR/base-$(base_key "$szDeb")
    [ -e "$szBase/vmlinuz" ] || base_build "$szDeb" "$szBase"
    exec 9>&-
    printf '%s\n' "$szBase"
}
