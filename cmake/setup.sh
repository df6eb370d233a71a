# SPDX-License-Identifier: MIT
# shellcheck shell=bash
#
# What ./demo and ./check share: which systems they set up, and how the packages are installed.

# shellcheck source=SCRIPTDIR/packages.sh
. cmake/packages.sh

say() { printf '\033[1m== %s\033[0m\n' "$*"; }

die() { printf '%s: %s\n' "${0##*/}" "$*" >&2; exit 1; }

# Everybody else is told what to do instead, before anything is installed.
system_check() {
    local szMachine szSystem
    szMachine=$(uname -m)
    case $szMachine:$(system_codename) in
    x86_64:bookworm | x86_64:trixie) return ;;
    esac
    szSystem=$(sed -n 's/^PRETTY_NAME="\(.*\)"$/\1/p' /etc/os-release 2>/dev/null)
    die "this sets up Debian 12 and 13 on x86-64, not ${szSystem:-another system} on $szMachine:" \
        "build with CMake as README.md shows, with packages for the functions that cmake/packages lists"
}

# What the virtual appliance has to fetch for itself.
inside_uris() { # NAME...
    local szInside
    szInside=$(packages_of inside "$(system_codename)" "$@")
    [ -z "$szInside" ] || (. appliance/lib/common.sh && . appliance/lib/fetch.sh && fetch_uris)
}

# packages_install LOG NAME...: what these need and is not there yet; nothing at all when everything is.
packages_install() {
    local szLog=$1 szPackage szUris
    local -a missing=()
    shift
    system_check
    for szPackage in $(packages_of outside "$(system_codename)" tool "$@"); do
        is_installed "$szPackage" || missing+=("$szPackage")
    done
    [ "${#missing[@]}" -gt 0 ] || return 0
    [ "$(id -u)" -eq 0 ] || die "run as root once to install: ${missing[*]}"
    export DEBIAN_FRONTEND=noninteractive
    say "reading what packages there are"
    apt-get update -q >"$szLog" 2>&1 || die "apt-get update failed, see $szLog"
    szUris=$(apt-get install -y -qq --no-install-recommends --print-uris "${missing[@]}" && inside_uris "$@") ||
        die "there are no such packages: ${missing[*]}"
    say "installing ${missing[*]} and what they need: $(uris_told <<<"$szUris")"
    apt-get install -y -q --no-install-recommends "${missing[@]}" >>"$szLog" 2>&1 ||
        die "apt-get could not install them, see $szLog"
}
