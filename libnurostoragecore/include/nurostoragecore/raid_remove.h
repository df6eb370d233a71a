// SPDX-License-Identifier: MIT
#pragma once

// Taking an array down for good: stopped, and no superblock of its UUID left on a data partition.

#include "nurocore/hash.h"
#include "nurostoragecore/raid_info.h"

// RAIDRemove without a map.
int RAIDRemoveByInfo(const RAID_INFO *pInfo);

// Stops the array, in up to three attempts a second apart, and wipes its superblocks; pUuidHash
// maps partitions to UUIDs and stays the caller's, NULL makes one for the purpose. Returns 0 when
// the array was stopped, whatever became of the superblocks, else -1.
int RAIDRemove(const RAID_INFO *pInfo, PNLIBHASH pUuidHash);

// "mdadm -S" and "mdadm --zero-superblock". 0, or -1 with the code of the runner.
int RAIDStop(const char *szMd);
int RAIDZeroSuperblock(const char *szDevice);

// Wipes every partition that the map gives szUuid; nothing is read of the record. Returns 0, or -1
// at the first wipe that fails or without a map.
int RAIDCleanSuperblock(const RAID_INFO *pInfo, const char *szUuid, PNLIBHASH pUuidHash);

// Fills the map with the UUID of every data partition (number 3 and up) of an sd disk that has a
// superblock. The map may move. Returns 0 or -1.
int RAIDUUIDHashForRemoveGet(PNLIBHASH *ppUuidHash);

// Copies the UUID of a running array, as its first member's superblock tells it, to szBuf, cut to
// cbBuf. Returns 1, 0 when the array is absent, -1 on failure (ERR_BAD_PARAMETER,
// ERR_NO_MEMBER_DISK or the code of the query).
int RAIDUUIDGet(const char *szMd, char *szBuf, int cbBuf);
