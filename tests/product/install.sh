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
PLATFORM_FILES="usr/libexec/arrayctl/sfdisk
usr/sbin/mdrequests
usr/share/man/man8/mdrequests.8.gz"

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
    cmp "$SCRATCH/tested" "$AMD64/arrayctl-platform/usr/libexec/arrayctl/sfdisk"
}

no_build_path_in_the_program() {
    ! grep -aq "$SCRATCH" "$AMD64/tool/arrayctl" || complain "the build's folder is in the program"
}

packing_again_gives_the_same() {
    mkdir -p "$SCRATCH/first"
    cp "$DEBS"/*_amd64.deb "$SCRATCH/first" && make_deb amd64 || return 1
    cmp "$SCRATCH/first/arrayctl_${VERSION}_amd64.deb" "$DEBS/arrayctl_${VERSION}_amd64.deb" &&
        cmp "$SCRATCH/first/arrayctl-platform_${VERSION}_amd64.deb" "$DEBS/arrayctl-platform_${VERSION}_amd64.deb"
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
        same 'libc6 (>= 2.34), lvm2, mdadm, mount' "$(field arrayctl "$szArch" Depends)" || return 1
        same "$szArch" "$(field arrayctl "$szArch" Architecture)" || return 1
    done
    same "libfdisk1 (>= 2.35), libc6 (>= 2.34), arrayctl (= $VERSION)" "$(field arrayctl-platform amd64 Depends)"
}

packages_hold_what_they_should() {
    same "${TOOL_FILES}.gz" "$(package_files arrayctl amd64)" || return 1
    same "${TOOL_FILES}.gz" "$(package_files arrayctl powerpc)" || return 1
    same "$PLATFORM_FILES" "$(package_files arrayctl-platform amd64)"
}

lintian_has_nothing_to_say() {
    local szSaid
    szSaid=$(lintian --fail-on info,warning,error "$DEBS"/*.deb 2>&1) && same \
        "running with root privileges is not recommended!" "$szSaid"
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
    local szOptions='-DARRAYCTL_BUILD_TESTS=OFF -DARRAYCTL_BUILD_PLATFORM=OFF' szOption
    same "$szOptions" "$(sed -n 's/^ARRAYCTL_CONF_OPTS = //p' packaging/buildroot/arrayctl/arrayctl.mk)" || return 1
    same "$szOptions" "$(sed -n 's/^EXTRA_OECMAKE = "\(.*\)"/\1/p' "packaging/yocto/arrayctl_$VERSION.bb")" || return 1
    for szOption in ARRAYCTL_BUILD_TESTS ARRAYCTL_BUILD_PLATFORM; do
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
test_is "the PowerPC program is one" powerpc_program_is_one
test_is "a package comes and goes without a trace" comes_and_goes_without_a_trace
test_is "a plain install leaves the platform out" plain_install_is_without_platform
test_is "an install goes where it is told" install_goes_where_it_is_told
test_is "the recipes fit the tree" recipes_fit_the_tree
test_is "a cross install into a staging tree" cross_install_into_a_staging_tree
test_is "one version everywhere" one_version_everywhere
test_is "the archive is reproducible" archive_is_reproducible
