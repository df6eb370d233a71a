# SPDX-License-Identifier: MIT
# shellcheck shell=bash
#
# The virtual appliance as a PowerPC machine: what is different about it. appliance/run reads this
# file when ARRAYCTL_MACHINE names it.

POWERPC_DIR=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd)
# shellcheck source=SCRIPTDIR/sources.sh
. "$POWERPC_DIR/sources.sh"

POWERPC_QEMU=qemu-system-ppc
POWERPC_MEMORY_MB=512

# shellcheck disable=SC2034  # read by require_host_tools
HOST_TOOLS=(
    "$POWERPC_QEMU:qemu-system-ppc"
    "$CROSS-gcc:gcc-$CROSS"
    qemu-ppc-static:qemu-user-static
    dpkg-source:dpkg-dev
    make:make
    bc:bc
    bison:bison
    flex:flex
    cpio:cpio
)

# Every program needs the C library alone, and that is in the base.
copy_with_libraries() { # SOURCE TARGET ROOT
    install -D "$1" "$3$2"
}

machine_accelerator() {
    echo tcg
}

# Changes with the source packages and with how things are made from them.
powerpc_base_key() {
    {
        dpkg-query -W -f '${Package} ${Version}\n' "$KERNEL_PACKAGE" "g++-$CROSS" libc6-powerpc-cross
        cat "$POWERPC_DIR/sources.sh" "$POWERPC_DIR/kernel.config" "${BASH_SOURCE[0]}"
    } | sha256sum | cut -c1-16
}

powerpc_script() { # TEXT PATH
    rm -f "$2"
    printf '#!/bin/sh\n%s\n' "$1" >"$2"
    chmod +x "$2"
}

powerpc_programs() {
    local szWork=$1 szRoot=$2 szPair szApplet
    for szPair in "${GUEST_PROGRAMS[@]}"; do
        install -D "$szWork/${szPair%%:*}" "$szRoot${szPair#*:}"
        "$CROSS-strip" "$szRoot${szPair#*:}"
    done
    install "$CROSS_ROOT/lib/libc.so.6" "$CROSS_ROOT/lib/ld.so.1" "$szRoot/usr/lib/"
    while read -r szApplet; do
        szApplet=$szRoot/usr/${szApplet#usr/}
        [ -e "$szApplet" ] || ln -s /usr/bin/busybox "$szApplet"
    done < <(qemu-ppc-static "$szRoot/usr/bin/busybox" --list-full | grep -v '^linuxrc$')
    # Everything is built into this kernel, which knows one kind of file system.
    powerpc_script '' "$szRoot/usr/sbin/modprobe"
    powerpc_script 'exec mke2fs -t ext2 "$@"' "$szRoot/usr/sbin/mkfs.ext4"
}

powerpc_base_build() {
    local szBase=$1 szWork szPackage
    szWork=$(mktemp -d "$CACHE_DIR/work.XXXXXX")
    mkdir "$szWork/out" "$szWork/root"
    for szPackage in "${!SOURCE_BUILDS[@]}"; do
        source_fetch "$szPackage" "$szWork"
        note "making $szPackage"
        (run_logged "$szWork/$szPackage.log" "${SOURCE_BUILDS[$szPackage]}" "$szWork/$szPackage") || exit
    done
    kernel_build "$szWork" "$szWork/out"
    base_root "$szWork/root"
    powerpc_programs "$szWork" "$szWork/root"
    libfdisk_keep "$szWork" "$szWork/out"
    pack "$szWork/root" "$szWork/out/base.cpio"
    mv "$szWork/out" "$szBase"
    rm -rf "$szWork"
}

# In the place of the x86-64 machine's base. Runs may start at the same time: one of them makes it,
# the others wait.
base_ready() {
    local szBase
    mkdir -p "$CACHE_DIR"
    exec 9>"$CACHE_DIR/lock-powerpc"
    flock 9
    szBase=$CACHE_DIR/powerpc-$(powerpc_base_key)
    [ -e "$szBase/vmlinux" ] || powerpc_base_build "$szBase" || exit
    exec 9>&-
    printf '%s\n' "$szBase"
}

machine_qemu() {
    local szKernelLine=$1
    shift
    # shellcheck disable=SC2154  # set by the appliance's own scripts
    exec "$POWERPC_QEMU" -nodefaults -no-user-config -display none -no-reboot \
        -machine ppce500 -cpu e500v2 -m "$POWERPC_MEMORY_MB" \
        -kernel "$szBaseDir/vmlinux" -initrd "$szWorkDir/initrd" \
        -append "console=ttyS0 panic=-1 oops=panic scsi_mod.scan=manual DISKS=$nDisks SILENCE=$((nSilence / 2)) $szKernelLine" \
        -device virtio-scsi-pci,id=scsi "${diskArguments[@]}" "$@"
}
