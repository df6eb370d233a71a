// SPDX-License-Identifier: MIT
#pragma once

// Which array a device belongs to, also when that array does not run: mdadm's examine report.

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

// Fills a record that the caller has zeroed with what the report on szDevice says. Returns 1, 0
// when the device has no superblock (record untouched), -1 on failure (record unusable): bad
// arguments, mdadm could not be started, a malformed line, or a read error before the end of the
// report, half of which must not pass for an array without a UUID. Each failure is in the log; the
// last-error record keeps what the start of mdadm left there, else it is untouched.
int RAIDSuperblockGet(const char *szDevice, RAID_SUPERBLOCK *pSuperblock);

// Takes one line of a report, which it cuts up, into the record. Returns 0, also for a line that
// says nothing of use, or -1 for a malformed one.
int RAIDSuperblockLineParse(char *szLine, RAID_SUPERBLOCK *pSuperblock);
