# SPDX-License-Identifier: MIT
# shellcheck shell=bash
#
# Packages that are fetched and unpacked, never installed: the kernel and the programs inside the
# appliance, of this machine's release of Debian or of another one.

# shellcheck source=SCRIPTDIR/../../cmake/packages.sh
. "$SOURCE_DIR/cmake/packages.sh"

DEBIAN_KEYRING=/usr/share/keyrings/debian-archive-keyring.gpg
DEBIAN_MIRROR=http://deb.debian.org
# Oldest first.
DEBIAN_RELEASES=(bookworm trixie)
szRelease=${ARRAYCTL_RELEASE:-$(system_codename)}
fUdev=${ARRAYCTL_UDEV:-no}

# The programs of this machine are as good as fetched ones when they are of the same release.
is_own_release() {
    [ "$szRelease" = "$(system_codename)" ]
}

# The machine's own libraries are too old for programs of a newer release.
is_newer_release() {
    ! is_own_release && [ "$szRelease" = "${DEBIAN_RELEASES[-1]}" ]
}

is_here() { # PACKAGE
    is_own_release && is_installed "$1"
}

# Another release's lists lie beside the machine's own, which stay as they are.
apt_inside() { # PROGRAM WORD...
    local szProgram=$1 szApt=$CACHE_DIR/$szRelease/apt
    local -a options=(-o APT::Sandbox::User=root)
    is_own_release || options+=(
        -o Dir::Etc::sourcelist=/dev/null -o "Dir::Etc::sourceparts=$szApt/parts"
        -o "Dir::State::lists=$szApt/lists" -o "Dir::Cache=$szApt/cache" -o Dir::State::status=/dev/null
    )
    "$szProgram" -q "${options[@]}" "${@:2}"
}

apt_lists() {
    local szApt=$CACHE_DIR/$szRelease/apt
    ! is_own_release && [ ! -e "$szApt/read" ] || return 0
    mkdir -p "$szApt/parts" "$szApt/lists/partial" "$szApt/cache/archives/partial"
    printf 'deb [signed-by=%s] %s/%s main\n' \
        "$DEBIAN_KEYRING" "$DEBIAN_MIRROR" "debian $szRelease" \
        "$DEBIAN_KEYRING" "$DEBIAN_MIRROR" "debian-security $szRelease-security" >"$szApt/parts/inside.list"
    note "reading what packages $szRelease has (once)"
    apt_inside apt-get update >"$szApt/log" 2>&1 || die "no list of packages: $(tail -n 1 "$szApt/log")"
    touch "$szApt/read"
}

# Of what the table has for the inside: what this machine lacks.
fetch_wanted() {
    local szPackage
    local -a who=(demo)
    # What only cases of tests need is installed for them.
    is_own_release || who=(appliance)
    [ "$fUdev" = no ] || who+=(udev)
    for szPackage in $(packages_of inside "$szRelease" "${who[@]}"); do
        is_here "$szPackage" || printf '%s\n' "$szPackage"
    done
}

# These with the libraries that they need, and the kernel that its package stands for.
fetch_closure() { # PACKAGE...
    local szPackage
    apt_inside apt-cache depends --recurse --important "$@" | awk -v given="$*" '
        BEGIN { split(given, names, " "); for (n in names) { taken[names[n]] = 1 } }
        /^[^ ]/ { from = $1 }
        /Depends: (z?lib|linux-image-[0-9])/ { edge[++edges] = from " " $NF }
        END {
            do {
                grown = 0
                for (n = 1; n <= edges; n++) {
                    split(edge[n], ends, " ")
                    if ((ends[1] in taken) && !(ends[2] in taken)) { taken[ends[2]] = grown = 1 }
                }
            } while (grown)
            for (name in taken) { print name }
        }' | sort | while read -r szPackage; do
        is_here "$szPackage" || printf '%s\n' "$szPackage"
    done
}

# As apt-get tells them; nothing when everything is there.
fetch_uris() {
    local -a wanted
    ! fetch_is_done || return 0
    mapfile -t wanted < <(fetch_all)
    # shellcheck disable=SC2046  # a list
    apt_inside apt-get download --print-uris $(fetch_closure "${wanted[@]}")
}

# What is wanted, and what was wanted before, which the next machine may want again.
fetch_all() {
    { fetch_wanted && cat "$CACHE_DIR/$szRelease/fetched" 2>/dev/null; } | sort -u
}

fetch_is_done() {
    [ "$(fetch_all)" = "$(cat "$CACHE_DIR/$szRelease/fetched" 2>/dev/null)" ]
}

# Prints the folder with the packages, fetched when they are not there.
fetch_packages() {
    local szFolder=$CACHE_DIR/$szRelease szUris
    mkdir -p "$szFolder"
    if ! fetch_is_done; then
        apt_lists
        szUris=$(fetch_uris) || die "the packages of the appliance are not known here; run apt-get update"
        note "fetching the kernel and the programs of the appliance: $(uris_told <<<"$szUris") (once)"
        rm -f "$szFolder"/*.deb
        # shellcheck disable=SC2046  # a list
        (cd "$szFolder" && apt_inside apt-get download $(awk '{ sub(/_.*/, "", $2); print $2 }' <<<"$szUris")) \
            >"$szFolder/log" 2>&1 || die "not fetched: $(tail -n 1 "$szFolder/log")"
        fetch_all >"$szFolder/fetched.new" && mv "$szFolder/fetched.new" "$szFolder/fetched"
    fi
    printf '%s\n' "$szFolder"
}
