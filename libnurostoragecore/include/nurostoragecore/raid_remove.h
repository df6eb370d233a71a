// SPDX-License-Identifier: MIT
#pragma once

// Removes an array for good: it is stopped, and no data partition keeps a superblock of its UUID.

#include "nurocore/hash.h"
#include "nurostoragecore/raid_info.h"

// RAIDRemove without a map.
int RAIDRemoveByInfo(const RAID_INFO *pInfo);

// Stops the array, in up to three attempts with a pause of one second after each that fails, and
// wipes its superblocks when its UUID is known: the record's own, else what RAIDUUIDGet finds
// before the stop. pUuidHash maps partitions to UUIDs and remains the caller's; with NULL a
// temporary map is built. Returns 0 when the array was stopped, whether or not all superblocks
// could be wiped; -1 for NULL (no code) and when it could not be stopped (code as RAIDStop).
int RAIDRemove(const RAID_INFO *pInfo, PNLIBHASH pUuidHash);

// Run "mdadm -S" and "mdadm --zero-superblock". Return 0, or -1: no code for NULL and when mdadm
// ran and failed, the code of SpaceExecl when it could not be started.
int RAIDStop(const char *szMd);
int RAIDZeroSuperblock(const char *szDevice);

// Wipes the superblock of every partition that pUuidHash maps to szUuid, in the order of the map's
// slots; with NULL a temporary map is built. pInfo is not used, but must not be NULL. Returns 0,
// also when no partition has that UUID; -1 for NULL (no code), when the map or the list of its keys
// cannot be built (ERR_OUT_OF_MEMORY, or the code of PartitionPathEnum), and at the first wipe that
// fails: the partitions after it keep their superblock.
int RAIDCleanSuperblock(const RAID_INFO *pInfo, const char *szUuid, PNLIBHASH pUuidHash);

// Adds to the map the UUID of every partition with number 3 or higher, a path that contains "sd"
// and a readable superblock; its path is the key. The map may be reallocated; a partition for which
// it cannot grow is left out. Returns 0, or -1: no code for NULL, ERR_OUT_OF_MEMORY, or the code of
// PartitionPathEnum.
int RAIDUUIDHashForRemoveGet(PNLIBHASH *ppUuidHash);

// Copies the UUID of a running array to szBuf, truncated to cbBuf bytes. It is read from the
// superblock of the first listed member, the one whose name sorts last. Returns 1, or -1:
// ERR_BAD_PARAMETER, ERR_NO_MEMBER_DISK, the code of RAIDInfoGet, or no code when that member has
// no readable superblock. 0 is reserved for an absent array and never returned, see RAIDInfoGet.
int RAIDUUIDGet(const char *szMd, char *szBuf, int cbBuf);
