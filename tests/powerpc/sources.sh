# SPDX-License-Identifier: MIT
# shellcheck shell=bash disable=SC2034
#
# The PowerPC machine's kernel and programs, all made from Debian's source packages with the cross
# compiler. They are made once and kept in the cache folder.

CROSS=powerpc-linux-gnu
CROSS_ROOT=/usr/$CROSS
# The one that this machine's release has.
KERNEL_PACKAGE=$(packages_of outside "$(system_codename)" powerpc-machine | grep '^linux-source-')
KERNEL_ARCHIVE=/usr/src/$KERNEL_PACKAGE.tar.xz
SOURCE_JOBS=$(nproc)

# Source packages are looked for beside the machine's own list of packages, which stays as it is.
DEBIAN_KEYRING=/usr/share/keyrings/debian-archive-keyring.gpg
DEBIAN_MIRROR=http://deb.debian.org/debian
DEBIAN_SUITE=bookworm

# Each source package, and the function that makes what is needed of it.
declare -A SOURCE_BUILDS=(
    [busybox]=busybox_build
    [e2fsprogs]=e2fsprogs_build
    [mdadm]=mdadm_build
    [strace]=strace_build
    [util-linux]=util_linux_build
)

# What was made, and where it lies inside.
GUEST_PROGRAMS=(
    busybox/busybox:/usr/bin/busybox
    e2fsprogs/e2fsck/e2fsck:/usr/sbin/e2fsck
    e2fsprogs/misc/mke2fs:/usr/sbin/mke2fs
    mdadm/mdadm:/usr/sbin/mdadm
    strace/src/strace:/usr/bin/strace
    util-linux/sfdisk:/usr/sbin/sfdisk.stock
    util-linux/blkid:/usr/sbin/blkid
    util-linux/wipefs:/usr/sbin/wipefs
)

# run_logged LOG COMMAND...: says how far it is now and then, so that nobody takes it for one that hangs.
run_logged() {
    local szLog=$1
    shift
    "$@" 2>&1 | tee -a "$szLog" |
        awk '++line % 100 == 0 { print "... " line " lines" >"/dev/stderr"; fflush() }'
    [ "${PIPESTATUS[0]}" -eq 0 ] || { tail -n 30 "$szLog" >&2; die "'$1' failed, see $szLog"; }
}

# source_fetch PACKAGE FOLDER: FOLDER/PACKAGE is the unpacked source.
source_fetch() {
    local szApt=$2/apt
    local -a options=(
        -o Dir::Etc::sourcelist=/dev/null -o "Dir::Etc::sourceparts=$szApt/parts"
        -o "Dir::State::lists=$szApt/lists" -o "Dir::Cache=$szApt/cache" -o APT::Sandbox::User=root
    )
    if [ ! -d "$szApt" ]; then
        mkdir -p "$szApt/parts" "$szApt/lists/partial" "$szApt/cache"
        printf 'deb-src [signed-by=%s] %s %s main\n' \
            "$DEBIAN_KEYRING" "$DEBIAN_MIRROR" "$DEBIAN_SUITE" >"$szApt/parts/source.list"
        run_logged "$2/apt.log" apt-get -q "${options[@]}" update
    fi
    note "fetching the source of $1"
    (cd "$2" && run_logged "$2/$1.log" apt-get -q "${options[@]}" source --download-only "$1")
    run_logged "$2/$1.log" dpkg-source -x "$2/$1"_*.dsc "$2/$1"
}

kernel_build() {
    local szWork=$1 szOut=$2
    local -a make=(make -C "$szWork/linux" ARCH=powerpc "CROSS_COMPILE=$CROSS-" -j "$SOURCE_JOBS")
    note "making the kernel of the PowerPC machine (once, some minutes)"
    mkdir "$szWork/linux"
    tar -xJf "$KERNEL_ARCHIVE" -C "$szWork/linux" --strip-components 1
    run_logged "$szWork/linux.log" "${make[@]}" "KCONFIG_ALLCONFIG=$POWERPC_DIR/kernel.config" allnoconfig
    kernel_config_check "$szWork/linux/.config"
    run_logged "$szWork/linux.log" "${make[@]}" vmlinux
    "$CROSS-strip" -o "$szOut/vmlinux" "$szWork/linux/vmlinux"
}

# The kernel's configuration drops what it cannot have without a word.
kernel_config_check() {
    local szMissing
    szMissing=$(grep '^CONFIG_' "$POWERPC_DIR/kernel.config" | grep -vxFf "$1" || true)
    [ -z "$szMissing" ] || die "the kernel does not take: $szMissing"
}

busybox_build() {
    local szSource=$1
    local -a make=(make -C "$szSource" ARCH=powerpc "CROSS_COMPILE=$CROSS-" -j "$SOURCE_JOBS")
    "${make[@]}" defconfig
    # Its tc does not build with the headers of newer kernels.
    sed -i -e 's/^CONFIG_TC=y/# CONFIG_TC is not set/' \
        -e 's/^# CONFIG_STATIC is not set/CONFIG_STATIC=y/' "$szSource/.config"
    "${make[@]}" busybox
}

e2fsprogs_build() {
    cd "$1" || return
    ./configure "--host=$CROSS" --prefix=/usr --disable-nls --disable-fuse2fs --disable-debugfs \
        --disable-defrag --disable-imager --disable-resizer --disable-uuidd \
        --disable-e2initrd-helper CFLAGS=-O2 &&
        make -j "$SOURCE_JOBS" libs && make -C e2fsck e2fsck && make -C misc mke2fs
}

mdadm_build() {
    # It hands the driver 64 bits of a device number where the request takes one word: the upper
    # half, on this processor.
    sed -i 's/^\(\t*\)rdev))) {$/\1(unsigned long)rdev))) {/' "$1/Manage.c"
    grep -q '(unsigned long)rdev))) {' "$1/Manage.c" || return
    make -C "$1" -j "$SOURCE_JOBS" "CC=$CROSS-gcc" "CXFLAGS=-O2 -DNO_LIBUDEV -D_FILE_OFFSET_BITS=64" \
        CWFLAGS= CHECK_RUN_DIR=0 mdadm
}

strace_build() {
    cd "$1" || return
    ./configure "--host=$CROSS" --prefix=/usr --enable-mpers=no --disable-gcc-Werror \
        --without-libdw --without-libunwind --without-libselinux CFLAGS=-O1 &&
        make -j "$SOURCE_JOBS" -C src
}

# Its generated files are newer than what they are made of, whatever the packages' patches say.
util_linux_build() {
    cd "$1" || return
    ./configure "--host=$CROSS" --prefix=/usr --disable-nls --disable-shared --enable-static \
        --disable-chfn-chsh --disable-login --disable-su --disable-runuser \
        --disable-nologin --disable-sulogin --disable-liblastlog \
        --without-python --without-ncurses --without-ncursesw --without-tinfo --without-systemd \
        --without-udev --without-readline --without-econf --disable-bash-completion \
        --disable-asciidoc CFLAGS=-O2 &&
        make -j "$SOURCE_JOBS" ACLOCAL=: AUTOMAKE=: AUTOCONF=: AUTOHEADER=: sfdisk blkid wipefs
}

# What the appliance's partitioner is linked with.
libfdisk_keep() { # WORK OUT
    local szLibrary
    install -D -m 644 "$1/util-linux/libfdisk/src/libfdisk.h" "$2/libfdisk/libfdisk.h"
    for szLibrary in fdisk blkid uuid; do
        install -m 644 "$1/util-linux/.libs/lib$szLibrary.a" "$2/libfdisk/"
    done
}

# What the rehearsal is linked with: Debian's main archive has no package of it for this processor.
blkid_build() {
    cd "$1" || return
    ./configure "--host=$CROSS" --prefix=/usr --disable-nls --disable-shared --enable-static \
        --disable-all-programs --enable-libblkid --without-udev --without-systemd --without-python \
        --disable-bash-completion --disable-asciidoc CFLAGS=-O2 &&
        make -j "$SOURCE_JOBS" ACLOCAL=: AUTOMAKE=: AUTOCONF=: AUTOHEADER=: libblkid.la
}

# blkid_ready CACHE: prints the folder of its header and archive; made once and kept there.
blkid_ready() {
    local szKept szWork
    szKept=$1/powerpc-blkid-$(declare -f blkid_build source_fetch | sha256sum | cut -c1-16)
    mkdir -p "$1"
    exec 9>"$1/lock-powerpc-blkid"
    flock 9
    if [ ! -d "$szKept" ]; then
        szWork=$(mktemp -d "$1/work.XXXXXX")
        source_fetch util-linux "$szWork"
        note "making libblkid for PowerPC"
        (run_logged "$szWork/util-linux.log" blkid_build "$szWork/util-linux") || return
        install -D -m 644 "$szWork/util-linux/libblkid/src/blkid.h" "$szWork/out/blkid/blkid.h"
        install -m 644 "$szWork/util-linux/.libs/libblkid.a" "$szWork/out/"
        mv "$szWork/out" "$szKept"
        rm -rf "$szWork"
    fi
    exec 9>&-
    printf '%s\n' "$szKept"
}

# partitioner_build LIBFDISK SOURCE OUT: the compiler's own libraries go in, as there is but the C
# library inside.
partitioner_build() {
    mkdir -p "$(dirname "$3")"
    "$CROSS-g++" -std=c++20 -O2 -fno-exceptions -fno-rtti -D_GNU_SOURCE -D_FILE_OFFSET_BITS=64 \
        -D_TIME_BITS=64 -I "$1" "$2"/*.cpp -L "$1" -static-libgcc -Wl,--as-needed \
        -lfdisk -lblkid -luuid -o "$3"
}
