# SPDX-License-Identifier: MIT
# shellcheck shell=bash
#
# What every script of the appliance uses: messages, folders, the check for tools.

APPLIANCE_DIR=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
SOURCE_DIR=$(dirname "$APPLIANCE_DIR")
CACHE_DIR=${XDG_CACHE_HOME:-$HOME/.cache}/arrayctl
QEMU=qemu-system-x86_64
# shellcheck disable=SC2034  # read by the scripts that source this file
readonly APPLIANCE_DIR SOURCE_DIR CACHE_DIR QEMU

fQuiet=no

note() {
    [ "$fQuiet" = yes ] || printf 'appliance: %s\n' "$*" >&2
}

complain() {
    printf 'appliance: %s\n' "$*" >&2
}

die() {
    complain "$@"
    exit "$EXIT_MACHINE"
}

# A script inside may end with any status; this one means that the machine itself failed.
EXIT_MACHINE=125

# Each program of the host that the appliance needs, and the package that brings it.
HOST_TOOLS=(
    "$QEMU:qemu-system-x86"
    busybox:busybox-static
    modprobe:kmod
    depmod:kmod
    readelf:binutils
)

require_host_tools() {
    local szPair
    local -a missing=()
    PATH=$PATH:/usr/sbin:/sbin
    for szPair in "${HOST_TOOLS[@]}"; do
        command -v "${szPair%%:*}" >/dev/null || missing+=("${szPair#*:}")
    done
    [ ${#missing[@]} -eq 0 ] || die "install first: apt-get install -y ${missing[*]}"
    [ "$(uname -m)" = x86_64 ] || die "the appliance is an x86-64 machine; this one is not"
}

# Copies a program or library and every shared library that it needs into a root folder.
copy_with_libraries() {
    local szSource=$1 szTarget=$2 szRoot=$3 szLibrary
    install -D "$szSource" "$szRoot$szTarget"
    while read -r szLibrary; do
        [ -e "$szRoot$szLibrary" ] || is_inside "$szLibrary" || install -D "$szLibrary" "$szRoot$szLibrary"
    done < <(libraries_of "$szSource")
}

# Paths are folded into /usr, as the appliance has /lib, /lib64, /bin and /sbin as links there.
libraries_of() {
    ldd "$1" 2>/dev/null | grep -o '/[^ ]*' | sed -e 's,^/lib,/usr/lib,' -e 's,^/usr/usr,/usr,'
}

pack() {
    (cd "$1" && find . -mindepth 1 | LC_ALL=C sort |
        busybox cpio -o -H newc -R 0:0) >"$2"
}
