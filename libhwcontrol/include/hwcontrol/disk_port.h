// SPDX-License-Identifier: MIT
#pragma once

// Which kind of port a disk is attached to. The model's configuration has a bit mask over disk
// letters for each kind; expansion units report their disks in sysfs.

#include "nurocore/szlist.h"

enum DISK_PORT_TYPE {
    UNKNOWN_DEVICE = 0, // a bad name, or the masks cannot be read
    INTERNAL_DEVICE = 1,
    ESATA_DEVICE = 2, // on an eSATA port, and no expansion unit reports it
    EUNIT_DEVICE = 3, // on an eSATA port, reported by an expansion unit
    USB_DEVICE = 4,
    BOOT_DEVICE = 5,
    ISD_DEVICE = 6,
    CACHE_DEVICE = 7,
    OTHER_DEVICE = 8, // a disk that is in no mask
    MMC_DEVICE = 9,
};

// The port type of a path or name, whole disk or partition. UNKNOWN_DEVICE on every failure.
DISK_PORT_TYPE ExternalDiskPortCheck(const char *szPath);

// The same for the bare name of a whole disk.
DISK_PORT_TYPE ExternalDiskPortCheckName(const char *szName);

// The port type of the disks that this machine builds its arrays from: those of the expansion unit
// on a dual-head model, else the internal ones.
DISK_PORT_TYPE ExternalDiskPortOfArrays();

// Appends the names (not paths) of all disks of a port type to the list and sorts it in byte order.
// Returns 0, also when there is none; -1 on failure, when the list may already have some of them.
int ExternalDiskPortEnum(DISK_PORT_TYPE type, PNLIBSZLIST *ppList);

// Writes the disk names that expansion units report to szOut, a blank after each; with fCheckOpen
// only those that can be opened. Returns 0 when there is at least one, else -1: ERR_BAD_PARAMETER,
// ERR_BAD_FORMAT when they do not fit, no code of its own when there is none.
int ExternalDiskPortEnumEunit(int fCheckOpen, char *szOut, int cbOut);

// 1 when the model has SAS ports, else 0. Read once per process.
int IsSupportSas();
