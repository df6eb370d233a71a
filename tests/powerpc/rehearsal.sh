# SPDX-License-Identifier: MIT
# shellcheck shell=bash
#
# The rehearsal for PowerPC, with a libblkid of its own. What sources this has sources.sh as well.

# rehearsal_build BUILD TARGET: into the folder "rehearsal" of a build for PowerPC, which is without it.
rehearsal_build() {
    local szLibrary
    szLibrary=$(blkid_ready "$CACHE_DIR") || return
    cmake --preset powerpc -B "$1/rehearsal" -DARRAYCTL_BUILD_REHEARSAL=ON \
        "-DBLKID_INCLUDE=$szLibrary" "-DBLKID_LIBRARY=$szLibrary/libblkid.a" &&
        cmake --build "$1/rehearsal" --target "$2"
}
