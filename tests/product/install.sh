#!/usr/bin/env bash
# SPDX-License-Identifier: MIT
#
# Installs and packages the tree from a read-only copy of itself: install.sh BUILD_DIR SCRATCH_DIR
# shellcheck disable=SC2317  # called by their names
set -u
ROOT=$(cd "$(dirname "$0")/../.." && pwd)
BUILD=$(cd "$1" && pwd)
SCRATCH=$2
SOURCE=$SCRATCH/some/other/folder
DEBS=$SCRATCH/debs
AMD64=$DEBS/amd64
VERSION=$(sed -n 's/^project(arrayctl VERSION \([0-9.]*\).*/\1/p' "$ROOT/CMakeLists.txt")
# shellcheck source=SCRIPTDIR/../support/verdict/verdict.sh
. "$ROOT/tests/support/verdict/verdict.sh"
cd "$ROOT" || exit 1

TOOL_FILES="usr/sbin/arrayctl
usr/share/bash-completion/completions/arrayctl
usr/share/man/man8/arrayctl.8"
DEV_FILES="usr/lib/MULTIARCH/cmake/arrayctl/arrayctl-config-release.cmake
usr/lib/MULTIARCH/cmake/arrayctl/arrayctl-config-version.cmake
usr/lib/MULTIARCH/cmake/arrayctl/arrayctl-config.cmake
usr/lib/MULTIARCH/libhwcontrol.a
usr/lib/MULTIARCH/libnurocore.a
usr/lib/MULTIARCH/libnurostoragecore.a
usr/lib/MULTIARCH/pkgconfig/hwcontrol.pc
usr/lib/MULTIARCH/pkgconfig/nurocore.pc
usr/lib/MULTIARCH/pkgconfig/nurostoragecore.pc"
PLATFORM_FILES="usr/libexec/arrayctl/sfdisk
usr/sbin/mdrequests
usr/share/man/man8/mdrequests.8.gz"

REHEARSE_FILES="usr/sbin/arrayctl-rehearse
usr/share/bash-completion/completions/arrayctl-rehearse
usr/share/man/man8/arrayctl-rehearse.8.gz"

# The C library that the programs of a release ask for; where it reads numbers of a newer C, a newer one.
declare -A LIBC=([bookworm]='libc6 (>= 2.34)' [trixie]='libc6 (>= 2.38)')
declare -A REHEARSE_LIBC=([bookworm]='libc6 (>= 2.36)' [trixie]='libc6 (>= 2.38)')
RELEASE=$(bash -c '. cmake/packages.sh && system_codename')

listing() { (cd "$1" && find . -type f -printf '%p %s %T@ %m\n' | LC_ALL=C sort); }

files_of() { (cd "$1" && find . -type f | sed 's,^\./,,' | LC_ALL=C sort); }

# Fails with the difference of two texts.
same() { diff <(printf '%s\n' "$1") <(printf '%s\n' "$2"); }

# What git would commit, as it stands, where nothing may be written.
source_copy() {
    mkdir -p "$SOURCE"
    git ls-files -co --exclude-standard -z | xargs -0 sh -c 'ls -d -- "$@" 2>/dev/null' - |
        tar -c -T - | tar -x -C "$SOURCE" || return 1
    chmod -R a-w "$SOURCE"
    listing "$SOURCE" >"$SCRATCH/source.before"
}

# In a mount namespace of its own the copy is read-only for root, too.
make_deb() { # ARCHITECTURE
    # shellcheck disable=SC2016  # for the inner shell
    SOURCE_DATE_EPOCH=1700000000 unshare -m sh -c \
        'mount --bind -o ro "$0" "$0" && exec "$0/packaging/make-deb" "$@"' "$SOURCE" --output "$DEBS" --arch "$1"
}

# The other build is the tested one, in another folder and from another one.
bytes_are_those_of_the_tested_build() {
    strip -o "$SCRATCH/tested" "$BUILD/tool/arrayctl" || return 1
    cmp "$SCRATCH/tested" "$AMD64/arrayctl/usr/sbin/arrayctl" || return 1
    strip -o "$SCRATCH/tested" "$BUILD/platform/sfdisk/sfdisk" || return 1
    cmp "$SCRATCH/tested" "$AMD64/arrayctl-platform/usr/libexec/arrayctl/sfdisk" || return 1
    strip -o "$SCRATCH/tested" "$BUILD/bench/arrayctl_static" || return 1
    cmp "$SCRATCH/tested" "$AMD64/arrayctl-static/usr/sbin/arrayctl"
}

no_build_path_in_the_program() {
    ! grep -aq "$SCRATCH" "$AMD64/tool/arrayctl" || complain "the build's folder is in the program"
}

packing_again_gives_the_same() {
    mkdir -p "$SCRATCH/first"
    cp "$DEBS"/*_amd64.deb "$SCRATCH/first" && make_deb amd64 || return 1
    local szPackage
    for szPackage in arrayctl arrayctl-static arrayctl-dev arrayctl-platform arrayctl-rehearse; do
        cmp "$SCRATCH/first/${szPackage}_${VERSION}_amd64.deb" "$DEBS/${szPackage}_${VERSION}_amd64.deb" || return 1
    done
}

source_is_untouched() {
    listing "$SOURCE" | diff "$SCRATCH/source.before" -
}

field() { dpkg-deb --field "$DEBS/$1_${VERSION}_$2.deb" "$3"; }

package_files() { # PACKAGE ARCHITECTURE
    dpkg-deb --fsys-tarfile "$DEBS/$1_${VERSION}_$2.deb" | tar -t | grep -v '/$' | sed 's,^\./,,' |
        grep -v '^usr/share/doc/' | LC_ALL=C sort
}

depends_are_right() {
    local szArch
    for szArch in amd64 powerpc; do
        same "${LIBC[$RELEASE]}, lvm2, mdadm, mount" "$(field arrayctl "$szArch" Depends)" || return 1
        same "$szArch" "$(field arrayctl "$szArch" Architecture)" || return 1
        same 'lvm2, mdadm, mount' "$(field arrayctl-static "$szArch" Depends)" || return 1
        same "arrayctl (= $VERSION)" "$(field arrayctl-static "$szArch" Provides)" || return 1
        same arrayctl "$(field arrayctl-static "$szArch" Conflicts)" || return 1
        same libc6-dev "$(field arrayctl-dev "$szArch" Depends)" || return 1
    done
    same "glibc (= $(dpkg-query -W -f '${source:Version}' libc6-dev))" "$(field arrayctl-static amd64 Built-Using)" || return 1
    [[ $(field arrayctl-static powerpc Built-Using) =~ ^glibc\ \(=\ [0-9].*\)$ ]] || return 1
    same "libblkid1 (>= 2.17), ${REHEARSE_LIBC[$RELEASE]}, arrayctl (= $VERSION) | arrayctl-static (= $VERSION)" \
        "$(field arrayctl-rehearse amd64 Depends)" || return 1
    same "libfdisk1 (>= 2.35), ${LIBC[$RELEASE]}, arrayctl (= $VERSION)" "$(field arrayctl-platform amd64 Depends)"
}

packages_hold_what_they_should() {
    same "${TOOL_FILES}.gz" "$(package_files arrayctl amd64)" || return 1
    same "${TOOL_FILES}.gz" "$(package_files arrayctl powerpc)" || return 1
    same "$PLATFORM_FILES" "$(package_files arrayctl-platform amd64)" || return 1
    same "$REHEARSE_FILES" "$(package_files arrayctl-rehearse amd64)" || return 1
    local szArch szHeaders
    szHeaders=$(git ls-files 'lib*/include/*.h' | sed 's,^lib[a-z]*/include,usr/include/arrayctl,' | LC_ALL=C sort)
    for szArch in amd64:x86_64-linux-gnu powerpc:powerpc-linux-gnu; do
        same "${TOOL_FILES}.gz" "$(package_files arrayctl-static "${szArch%:*}" | grep -v '^usr/share/lintian/')" || return 1
        same "$szHeaders
${DEV_FILES//MULTIARCH/${szArch#*:}}" "$(package_files arrayctl-dev "${szArch%:*}")" || return 1
    done
}

lintian_has_nothing_to_say() {
    local szSaid
    szSaid=$(lintian --fail-on info,warning,error "$DEBS"/*.deb 2>&1) && same \
        "running with root privileges is not recommended!" "$szSaid"
}

static_programs_are_static() {
    "$ROOT/tests/style/hardening" "$AMD64-static/tool/arrayctl:static" \
        "$DEBS/powerpc-static/tool/arrayctl:static-fixed"
}

# The arrays of a machine, as far as the libraries look at them.
members_of_an_array() { # PROGRAM
    # shellcheck disable=SC2016  # for the inner shell
    unshare -m sh -c 'mount -t tmpfs none /sys/block && mkdir -p /sys/block/md7/md/dev-sda1 /sys/block/md7/md/dev-sdb1 &&
        cd /sys/block/md7/md && echo in_sync | tee dev-sda1/state >dev-sdb1/state &&
        echo 0 >dev-sda1/slot && echo 1 >dev-sdb1/slot &&
        exec "$0" /dev/md7' "$1"
}

MEMBERS="/dev/sdb1 in slot 1
/dev/sda1 in slot 0"

# As pkg-config says it has to be compiled, with the package unpacked somewhere.
another_program_by_pkg_config() {
    local -x PKG_CONFIG_PATH=$AMD64/arrayctl-dev/usr/lib/x86_64-linux-gnu/pkgconfig
    # shellcheck disable=SC2046  # words of a command
    g++ -std=c++20 -Wall -Wextra -Wpedantic -Werror $(pkg-config --cflags nurostoragecore) \
        -o "$SCRATCH/members" tests/product/members/members.cpp $(pkg-config --libs nurostoragecore) || return 1
    same "$MEMBERS" "$(members_of_an_array "$SCRATCH/members")"
}

another_program_by_cmake() {
    cmake -S tests/product/members -B "$SCRATCH/members-cmake" -G Ninja \
        -DCMAKE_PREFIX_PATH="$AMD64/arrayctl-dev/usr" -DCMAKE_CXX_FLAGS="-Wall -Wextra -Wpedantic -Werror" &&
        cmake --build "$SCRATCH/members-cmake" || return 1
    same "$MEMBERS" "$(members_of_an_array "$SCRATCH/members-cmake/members")"
}

# Each alone and twice, all in order, and all the other way round.
headers_stand_alone() {
    local szInclude=$AMD64/arrayctl-dev/usr/include/arrayctl szUnits=$SCRATCH/units szHeader
    mkdir -p "$szUnits"
    local -a headers
    mapfile -t headers < <(cd "$szInclude" && find . -name '*.h' -printf '%P\n' | LC_ALL=C sort)
    [ "${#headers[@]}" -ge 20 ] || complain "only ${#headers[@]} headers" || return 1
    for szHeader in "${headers[@]}"; do
        printf '#include <%s>\n#include <%s>\n' "$szHeader" "$szHeader" >"$szUnits/${szHeader//\//-}.cpp"
    done
    printf '#include <%s>\n' "${headers[@]}" >"$szUnits/all.cpp"
    tac "$szUnits/all.cpp" >"$szUnits/reversed.cpp"
    # shellcheck disable=SC2016  # for the inner shell
    printf '%s\n' "$szUnits"/*.cpp | xargs -P 2 -I UNIT sh -ec '
        for compiler in g++ clang++-19; do
            for standard in c++20 c++2b; do
                $compiler -std=$standard -Wall -Wextra -Wpedantic -Werror -fsyntax-only -I "$0" UNIT
            done
        done' "$szInclude"
}

powerpc_program_is_one() {
    same 3 "$(readelf -h "$DEBS/powerpc/arrayctl/usr/sbin/arrayctl" | grep -cE 'ELF32|big endian|PowerPC')"
}

# As dpkg does it, in a root of its own.
comes_and_goes_without_a_trace() {
    local szTarget=$SCRATCH/target
    mkdir -p "$szTarget/var/lib/dpkg/info" "$szTarget/var/lib/dpkg/updates"
    : >"$szTarget/var/lib/dpkg/status"
    dpkg --root="$szTarget" --log="$SCRATCH/dpkg.log" --force-depends --force-script-chrootless -i \
        "$DEBS/arrayctl_${VERSION}_amd64.deb" "$DEBS/arrayctl-platform_${VERSION}_amd64.deb" || return 1
    [ -x "$szTarget/usr/sbin/arrayctl" ] && [ ! -e "$szTarget/usr/sbin/sfdisk" ] || return 1
    dpkg --root="$szTarget" --log="$SCRATCH/dpkg.log" -P arrayctl arrayctl-platform || return 1
    same "" "$(find "$szTarget" -path '*arrayctl*' -print)"
}

# Below DESTDIR, by prefix and by the folders that GNUInstallDirs knows.
plain_install_is_without_platform() {
    DESTDIR=$SCRATCH/stage cmake --install "$BUILD" --prefix /usr >/dev/null || return 1
    same "$TOOL_FILES" "$(files_of "$SCRATCH/stage" | grep -v '^usr/share/doc/')" || return 1
    files_of "$SCRATCH/stage" | grep -qx usr/share/doc/arrayctl/docs/architecture.md ||
        complain "the docs are missing"
}

install_goes_where_it_is_told() {
    cmake -S "$SOURCE" -B "$AMD64" -DCMAKE_INSTALL_SBINDIR=lib/installer -DCMAKE_INSTALL_MANDIR=doc/man \
        -DCMAKE_INSTALL_DATADIR=data >/dev/null || return 1
    DESTDIR=$SCRATCH/told cmake --install "$AMD64" --prefix /opt/tool --component tool >/dev/null || return 1
    same "opt/tool/data/bash-completion/completions/arrayctl
opt/tool/doc/man/man8/arrayctl.8
opt/tool/lib/installer/arrayctl" "$(files_of "$SCRATCH/told")"
}

# What the recipes hand to cmake is what the PowerPC build above was made with.
recipes_fit_the_tree() {
    local szOptions='-DARRAYCTL_BUILD_TESTS=OFF -DARRAYCTL_BUILD_PLATFORM=OFF -DARRAYCTL_BUILD_REHEARSAL=OFF' szOption
    same "$szOptions" "$(sed -n 's/^ARRAYCTL_CONF_OPTS = //p' packaging/buildroot/arrayctl/arrayctl.mk)" || return 1
    same "$szOptions" "$(sed -n 's/^EXTRA_OECMAKE = "\(.*\)"/\1/p' "packaging/yocto/arrayctl_$VERSION.bb")" || return 1
    same '-DARRAYCTL_STATIC=ON' "$(sed -n 's/^ARRAYCTL_CONF_OPTS += //p' packaging/buildroot/arrayctl/arrayctl.mk)" || return 1
    same '-DARRAYCTL_STATIC=ON,-DARRAYCTL_STATIC=OFF' \
        "$(sed -n 's/^PACKAGECONFIG\[static\] = "\(.*\)"/\1/p' "packaging/yocto/arrayctl_$VERSION.bb")" || return 1
    grep -q '^option(ARRAYCTL_STATIC ' CMakeLists.txt || complain "no option ARRAYCTL_STATIC" || return 1
    for szOption in ARRAYCTL_BUILD_TESTS ARRAYCTL_BUILD_PLATFORM ARRAYCTL_BUILD_REHEARSAL; do
        grep -q "^option($szOption " CMakeLists.txt || complain "no option $szOption" || return 1
        grep -q "^$szOption:BOOL=OFF" "$DEBS/powerpc/CMakeCache.txt" || complain "$szOption was on" || return 1
    done
    grep -q "md5=$(md5sum LICENSE | cut -d' ' -f1)" "packaging/yocto/arrayctl_$VERSION.bb" ||
        complain "the licence's checksum is another one"
}

cross_install_into_a_staging_tree() {
    DESTDIR=$SCRATCH/cross cmake --install "$DEBS/powerpc" --component tool >/dev/null &&
        same "$TOOL_FILES" "$(files_of "$SCRATCH/cross")"
}

one_version_everywhere() {
    same "$VERSION" "$(sed -n 's/^## \([0-9.]*\).*/\1/p' CHANGELOG.md | head -n 1)" &&
        same "$VERSION" "$(sed -n 's/^ARRAYCTL_VERSION = //p' packaging/buildroot/arrayctl/arrayctl.mk)" &&
        same "$VERSION" "$(field arrayctl amd64 Version)" &&
        [ -f "packaging/yocto/arrayctl_$VERSION.bb" ]
}

archive_is_reproducible() {
    packaging/make-archive "$SCRATCH/one" && sleep 1.1 && packaging/make-archive "$SCRATCH/two" || return 1
    cmp "$SCRATCH/one/arrayctl-$VERSION.tar.gz" "$SCRATCH/two/arrayctl-$VERSION.tar.gz" || return 1
    same "$(git ls-tree -r --name-only HEAD | LC_ALL=C sort)" \
        "$(tar -tf "$SCRATCH/one/arrayctl-$VERSION.tar.gz" | grep -v '/$' | sed 's,^[^/]*/,,' | LC_ALL=C sort)"
}

test_is "a copy of the tree" source_copy
test_is "packages for amd64 from a read-only source" make_deb amd64
test_is "packages for PowerPC from a read-only source" make_deb powerpc
test_is "the source is untouched" source_is_untouched
test_is "another folder gives the same bytes" bytes_are_those_of_the_tested_build
test_is "no path of the build is in the program" no_build_path_in_the_program
test_is "packing again gives the same bytes" packing_again_gives_the_same
test_is "packages hold what they should" packages_hold_what_they_should
test_is "packages depend on what they need" depends_are_right
test_is "lintian has nothing to say" lintian_has_nothing_to_say
test_is "static programs are static" static_programs_are_static
test_is "another program uses the libraries by pkg-config" another_program_by_pkg_config
test_is "another program uses the libraries by CMake" another_program_by_cmake
test_is "headers stand alone, with either compiler" headers_stand_alone
test_is "the PowerPC program is one" powerpc_program_is_one
test_is "a package comes and goes without a trace" comes_and_goes_without_a_trace
test_is "a plain install leaves the platform out" plain_install_is_without_platform
test_is "an install goes where it is told" install_goes_where_it_is_told
test_is "the recipes fit the tree" recipes_fit_the_tree
test_is "a cross install into a staging tree" cross_install_into_a_staging_tree
test_is "one version everywhere" one_version_everywhere
test_is "the archive is reproducible" archive_is_reproducible
