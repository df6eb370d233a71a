// SPDX-License-Identifier: MIT
#pragma once

// Taking an array down for good: stopped, and no superblock of its UUID left on a data partition.

#include "nurocore/hash.h"
#include "nurostoragecore/raid_info.h"

// RAIDRemove without a map.
int RAIDRemoveByInfo(const RAID_INFO *pInfo);

// Stops the array, in up to three attempts with a pause of a second after each that fails, and
// wipes its superblocks when its UUID is known: the record's own, else the one that the superblock
// of the record's last-named member tells before the stop. pUuidHash maps partitions to UUIDs and
// stays the caller's; NULL makes one for the purpose. Returns 0 when the array was stopped,
// whatever became of the superblocks; -1 for NULL (no code) and when it could not be stopped (as
// RAIDStop).
int RAIDRemove(const RAID_INFO *pInfo, PNLIBHASH pUuidHash);

// "mdadm -S" and "mdadm --zero-superblock". 0, or -1: for NULL and when mdadm ran and failed no
// code, when it could not be started that of SpaceExecl.
int RAIDStop(const char *szMd);
int RAIDZeroSuperblock(const char *szDevice);

// Wipes every partition that the map gives szUuid, in the order of the map's slots; pInfo only has
// to be there. NULL for pUuidHash makes a map for the purpose. Returns 0, also when no partition
// has that UUID; -1 for NULL (no code), when the map or the list of its keys cannot be had
// (ERR_OUT_OF_MEMORY, or the code of PartitionPathEnum), and at the first wipe that fails:
// partitions behind it keep their superblock.
int RAIDCleanSuperblock(const RAID_INFO *pInfo, const char *szUuid, PNLIBHASH pUuidHash);

// Fills the map with the UUID of every partition of number 3 and up that has a superblock which can
// be read, and whose path contains "sd"; its path is the key. The map may move; a partition for
// which it cannot grow is left out. Returns 0, or -1: NULL (no code), ERR_OUT_OF_MEMORY, or the
// code of PartitionPathEnum.
int RAIDUUIDHashForRemoveGet(PNLIBHASH *ppUuidHash);

// Copies the UUID of a running array to szBuf, cut to cbBuf bytes, as the superblock of its first
// member tells it: the one whose name sorts last. Returns 1, or -1: ERR_BAD_PARAMETER,
// ERR_NO_MEMBER_DISK, the code of RAIDInfoGet, or no code when that member has no superblock that
// can be read. 0 is reserved for an absent array and does not happen, see RAIDInfoGet.
int RAIDUUIDGet(const char *szMd, char *szBuf, int cbBuf);
