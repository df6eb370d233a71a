# SPDX-License-Identifier: MIT
# shellcheck shell=bash
#
# Reads the table of packages beside it.

PACKAGES=$(dirname "${BASH_SOURCE[0]}")/packages

# The release's own name, where this is Debian.
system_codename() {
    (. /etc/os-release 2>/dev/null && [ "${ID:-}" != debian ] || printf '%s\n' "${VERSION_CODENAME:-}")
}

# for_whom FOR NAME...: whether one of the names is among the words of the table, sets being opened.
for_whom() {
    local szFor=" $1 " szSet szName szPattern
    local -a patterns
    shift
    for szSet in "${!sets[@]}"; do
        szFor=${szFor/ $szSet / ${sets[$szSet]} }
    done
    read -r -a patterns <<<"$szFor"
    for szName in "$@"; do
        for szPattern in "${patterns[@]}"; do
            # shellcheck disable=SC2053  # a pattern
            [[ $szName != $szPattern ]] || return 0
        done
    done
    return 1
}

# packages_of inside|outside RELEASE NAME...: one a line; a name is tool, demo, check or a suite's.
packages_of() {
    local szWhere=$1 szRelease=$2 szPackage szFor
    local -A sets=()
    shift 2
    while IFS='|' read -r szPackage szFor _; do
        case $szPackage in
        '#'* | '') continue ;;
        *=*) sets[${szPackage%% *}]=${szPackage#*= } && continue ;;
        esac
        read -r szPackage <<<"$szPackage"
        [[ ${szPackage:0:1} == + ]] && [ "$szWhere" = outside ] && continue
        [[ ${szPackage:0:1} != + ]] && [ "$szWhere" = inside ] && continue
        szPackage=${szPackage#+}
        [[ $szPackage != *:* || $szPackage == "$szRelease":* ]] || continue
        ! for_whom "$szFor" "$@" || printf '%s\n' "${szPackage#"$szRelease":}"
    done <"$PACKAGES"
}

is_installed() { # PACKAGE
    dpkg-query -W -f '${Status}' "$1" 2>/dev/null | grep -q 'ok installed'
}

# What apt-get has to fetch, from the lines of --print-uris: a package that is there twice counts once.
uris_told() {
    sort -u -k 2,2 | awk '/^\047/ { nPackage++; nByte += $3 }
        END { printf "%d packages, %.1f MB to fetch\n", nPackage, nByte / 1e6 }'
}
