// SPDX-License-Identifier: MIT
#pragma once

// A disk's state in the two system arrays. A pair is two records: the root array's, then the swap
// array's.

#include "nurocore/types.h"
#include "nurostoragecore/raid_info.h"

// Frees both records and sets both pointers to NULL; a NULL pair is ignored.
void RAIDInfoPairFree(RAID_INFO **ppPair);

// The disk's member state in each array, DISK_STATE_NONE where it is not a member. Returns 1 when
// it is in at least one of them, 0 when in neither, -1 with ERR_BAD_PARAMETER for NULL and for a
// disk name of 128 characters or more.
int RAIDSystemDiskStatusDetailGet(RAID_INFO *const *ppPair, const char *szDisk, u32 *pRootState,
                                  u32 *pSwapState);

// DISK_STATE_NORMAL when its system partitions are healthy, DISK_STATE_FAILED when they need
// repair, DISK_STATE_NONE when it has none; pStatus may be NULL. Returns as above.
int RAIDSystemDiskStatusGet(RAID_INFO *const *ppPair, const char *szDisk, u32 *pStatus);
