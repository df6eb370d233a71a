// SPDX-License-Identifier: MIT
#pragma once

// Member disks of an array and its sync action, as the md driver reports them in sysfs.

#include "nurocore/types.h"

// The state of a member in its array. Single bits.
constexpr u32 DISK_STATE_NORMAL = 1;
constexpr u32 DISK_STATE_FAILED = 2;
constexpr u32 DISK_STATE_CRASHING = 4; // failed, and crashed its array
constexpr u32 DISK_STATE_REBUILDING = 8;
constexpr u32 DISK_STATE_SPARE = 16;
constexpr u32 DISK_STATE_NONE = 32; // not a member; never read from sysfs

constexpr int RAID_PATH_SIZE = 128;

struct RAID_DISK {
    char szPath[RAID_PATH_SIZE]; // "/dev/" and the member's kernel name
    u32 state;                   // one of DISK_STATE_*
    i32 slot;                    // -1 for none
    RAID_DISK *pNext;
};

constexpr int SYNC_ACTION_IDLE = 0;
constexpr int SYNC_ACTION_FROZEN = 1;
constexpr int SYNC_ACTION_RESHAPE = 2;
constexpr int SYNC_ACTION_RESYNC = 3;
constexpr int SYNC_ACTION_CHECK = 4;
constexpr int SYNC_ACTION_REPAIR = 5;
constexpr int SYNC_ACTION_RECOVER = 6;

// The members of "/dev/md%d", last name first; a member that cannot be read is left out. Returns
// 0 with the list in *ppDisks (untouched when there is no member; the caller frees it with
// RAIDDiskListFree), or -1: ERR_BAD_PARAMETER, ERR_BAD_FORMAT for another path, ERR_SYSCALL_FAILED.
int RAIDDiskListGet(const char *szMd, RAID_DISK **ppDisks);

// The member of one sysfs directory ".../dev-NAME". Returns 0 with a record that the caller owns,
// or -1: ERR_BAD_PARAMETER, ERR_OUT_OF_MEMORY, ERR_TEXT_NOT_FOUND without "dev-", ERR_OPEN_FAILED
// or ERR_READ_FAILED for its state, ERR_READ_FAILED for an empty slot file; no code when the slot
// file does not open.
int RAIDDiskCreate(const char *szDir, RAID_DISK **ppDisk);

// The state of the member of one sysfs directory. Returns 0, or -1: ERR_BAD_PARAMETER,
// ERR_OPEN_FAILED, ERR_READ_FAILED.
int RAIDDiskStatusGet(const char *szDir, u32 *pState);

constexpr int RAID_ATTR_SIZE = 32;

// Reads the first line of a sysfs attribute, at most 31 characters, into szBuf of RAID_ATTR_SIZE
// bytes. Returns 0, or -1: ERR_BAD_PARAMETER, ERR_OPEN_FAILED, ERR_READ_FAILED.
int RAIDDiskAttrRead(const char *szFile, char *szBuf);

// Prepends a record to the list, which then owns it. Bad arguments change nothing and set
// ERR_OUT_OF_MEMORY.
void RAIDDiskListPush(RAID_DISK **ppDisks, RAID_DISK *pDisk);

// Frees every record; NULL is ignored.
void RAIDDiskListFree(RAID_DISK *pDisks);

// Finds the member on the same disk as szDisk; partition numbers are ignored. Returns 1 with the
// record, which the list still owns, in *ppDisk (ppDisk may be NULL), 0 when there is none, -1 with
// ERR_BAD_PARAMETER for a NULL name.
int RAIDDiskListSearch(RAID_DISK *pDisks, const char *szDisk, RAID_DISK **ppDisk);

// The current action of /dev/md<nMd>, one of SYNC_ACTION_*. Returns 0, or -1: ERR_BAD_PARAMETER
// when pAction is NULL, else no code.
int RAIDSyncActionGet(int nMd, int *pAction);
