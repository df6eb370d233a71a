// SPDX-License-Identifier: MIT
#pragma once

// Which array a device belongs to, even when that array is not running: mdadm's examine report.

#include "nurocore/types.h"
#include "nurostoragecore/raid_info.h"

constexpr int RAID_MD_PATH_SIZE = 64;

struct RAID_SUPERBLOCK {
    i32 majorVersion;
    i32 minorVersion;
    char szUuid[RAID_UUID_SIZE];
    char szMdPath[RAID_MD_PATH_SIZE]; // "/dev/md%d"
    u32 level;                        // one of RAID_LEVEL_*
    i32 nRaidDevices;
    i32 deviceRole; // slot; -1 for a spare
    i32 events;
};

// Fills a record, zeroed by the caller, from the report on szDevice. Returns 1, 0 when the device
// has no superblock (record untouched), -1 on failure (record unusable): bad arguments, mdadm could
// not be started, a malformed line, or a read error before the end of the report, since a partial
// report must not be taken for that of an array without a UUID. Each failure is logged. The
// last-error record has the code of a failed start of mdadm; other failures do not change it.
int RAIDSuperblockGet(const char *szDevice, RAID_SUPERBLOCK *pSuperblock);

// Parses one line of a report into the record; szLine is modified. Returns 0, also for a line with
// nothing of use, or -1 for a malformed one.
int RAIDSuperblockLineParse(char *szLine, RAID_SUPERBLOCK *pSuperblock);
