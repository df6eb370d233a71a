# SPDX-License-Identifier: MIT
SUMMARY = "Prepares, reports on and takes down the disk arrays of a storage appliance"
DESCRIPTION = "One command a run, for installer and maintenance scripts. It wipes disks. The \
appliance's own partitioner is expected as /sbin/sfdisk."
SECTION = "base"
LICENSE = "MIT"
LIC_FILES_CHKSUM = "file://LICENSE;md5=a9d69e424141286992201a4ed68aa5e9"

# The archive that packaging/make-archive writes, beside this file.
SRC_URI = "file://${BP}.tar.gz"

inherit cmake bash-completion

EXTRA_OECMAKE = "-DARRAYCTL_BUILD_TESTS=OFF -DARRAYCTL_BUILD_PLATFORM=OFF -DARRAYCTL_BUILD_REHEARSAL=OFF"

# Linked with a copy of the C library, for the small root of an installer.
PACKAGECONFIG ??= ""
PACKAGECONFIG[static] = "-DARRAYCTL_STATIC=ON,-DARRAYCTL_STATIC=OFF"

RDEPENDS:${PN} = "lvm2 mdadm util-linux-umount"
