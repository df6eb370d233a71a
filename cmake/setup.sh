# SPDX-License-Identifier: MIT
# shellcheck shell=bash
#
# What ./demo and ./check share: the one list of packages, and how they are installed.

# One package a line, with what it is for.
PACKAGES=(
    cmake ninja-build            # the build
    g++ libc6-dev                # the compiler of the release
    clang-14 clang-tidy-14       # the second compiler, the linter
    clang-format-14              # the layout of the source
    cppcheck shellcheck codespell
    googletest libgtest-dev      # unit, sandbox and fault suites
    pkg-config libfdisk-dev      # the stand-in partitioner
    libblkid-dev                 # the rehearsal
    fdisk util-linux             # reading back what the partitioner wrote
    python3                      # include-direction check, small reports
    binutils strace              # readelf and system-call counts
    libbenchmark-dev             # the containers beside the standard ones
    libclang-rt-14-dev           # the fuzz suite
    valgrind                     # the valgrind suite, instruction counts
    qemu-system-x86 qemu-utils   # the virtual appliance
    busybox-static kmod cpio gzip xz-utils
    g++-powerpc-linux-gnu        # the appliance's own processor: the compiler,
    qemu-user-static             # its programs on this machine,
    qemu-system-ppc              # a whole machine of it,
    linux-source-6.1 make bc bison flex # the kernel of that machine
    dpkg-dev                     # and its programs, from source packages
    g++-12-multilib              # 32-bit words on this machine
    mdadm lvm2 dmsetup e2fsprogs gdisk
    mandoc lintian               # the manual page, the Debian packages
    procps ca-certificates
)

say() { printf '\033[1m== %s\033[0m\n' "$*"; }

die() { printf '%s: %s\n' "${0##*/}" "$*" >&2; exit 1; }

packages_missing() {
    local szPackage
    for szPackage in "${PACKAGES[@]}"; do
        dpkg-query -W -f '${Status}' "$szPackage" 2>/dev/null | grep -q 'ok installed' ||
            printf '%s\n' "$szPackage"
    done
}

# Installs what is not there yet; nothing at all when everything is.
packages_install() {
    local -a missing
    mapfile -t missing < <(packages_missing)
    [ "${#missing[@]}" -eq 0 ] && return 0
    [ "$(id -u)" -eq 0 ] || die "run as root once to install: ${missing[*]}"
    say "installing ${#missing[@]} packages: ${missing[*]}"
    export DEBIAN_FRONTEND=noninteractive
    apt-get update -q >/dev/null || die "apt-get update failed"
    apt-get install -y -q --no-install-recommends "${missing[@]}" >"${1:-/dev/null}" 2>&1 ||
        die "apt-get could not install: ${missing[*]}"
}
