// SPDX-License-Identifier: MIT
#pragma once

// The state of an md array, as the driver reports it. Nothing here changes it.

#include "nurocore/types.h"
#include "nurostoragecore/raid_disk.h"

// The kernel's header names array states that nothing here uses; its types are needed.
#include <linux/types.h>

#include <linux/raid/md_u.h>

// Single bits, so that a set of levels is tested with one mask. 0 stands for any other level.
constexpr u32 RAID_LEVEL_0 = 1;
constexpr u32 RAID_LEVEL_1 = 2;
constexpr u32 RAID_LEVEL_5 = 4;
constexpr u32 RAID_LEVEL_6 = 8;
constexpr u32 RAID_LEVEL_10 = 16;
constexpr u32 RAID_LEVEL_LINEAR = 32;

constexpr u32 RAID_STATUS_NORMAL = 1;
constexpr u32 RAID_STATUS_DEGRADE = 2;
constexpr u32 RAID_STATUS_CRASHED = 4;

constexpr u32 REBUILD_NONE = 0;
constexpr u32 REBUILD_PROGRESSING = 1;
constexpr u32 REBUILD_WAITING = 2;

struct RAID_REBUILD_STATUS {
    u32 state; // one of REBUILD_*
    u64 done;  // both in the driver's unit, 0 when nothing runs
    u64 total;
};

constexpr int RAID_UUID_SIZE = 64;

struct RAID_INFO {
    i32 nMd; // N of /dev/mdN
    char szPath[RAID_PATH_SIZE];
    char szUuid[RAID_UUID_SIZE]; // empty unless a caller sets it
    u32 level;                   // one of RAID_LEVEL_*, 0 for any other md level
    i32 majorVersion;            // of the superblock: 0 for 0.90, 1 for 1.x
    i32 minorVersion;
    u32 status; // one of RAID_STATUS_*
    RAID_REBUILD_STATUS rebuild;
    u64 arraySize;  // bytes
    u64 deviceSize; // bytes used on each member; 0 for RAID 0 and linear
    i32 nRaidDisks; // slots
    i32 nActiveDisks;
    i32 nSpareDisks;
    RAID_DISK *pDisks; // owned by the record
};

// The array behind "/dev/md%d". Returns 1 with a record that the caller frees with RAIDInfoFree, or
// -1: ERR_BAD_PARAMETER, ERR_BAD_FORMAT for another path, ERR_OUT_OF_MEMORY, ERR_OPEN_FAILED, or
// the code of the request that failed. 0 is reserved for an absent array, and callers handle it,
// but it is never returned: a node without a running array gives -1 with ERR_SYSCALL_FAILED,
// because RAIDIoctlInfo never leaves ERR_DEVICE_ABSENT.
int RAIDInfoGet(const char *szMd, RAID_INFO **ppInfo);

// NULL is ignored.
void RAIDInfoFree(RAID_INFO *pInfo);

// One request each to the open array. They return 0, or -1 with a code in the last-error record:
// ERR_BAD_PARAMETER for NULL (in RAIDRebuildStatusGet for a negative descriptor, too), else by
// errno:
//
//                          | ENODEV             | EINTR              | any other
//     RAIDIoctlInfo        | SYSCALL_FAILED (!) | INTERRUPTED        | SYSCALL_FAILED
//     RAIDIoctlSize        | DEVICE_ABSENT      | SYSCALL_FAILED (!) | SYSCALL_FAILED
//     RAIDIoctlStatus      | DEVICE_ABSENT      | INTERRUPTED        | SYSCALL_FAILED
//     RAIDRebuildStatusGet | DEVICE_ABSENT      | SYSCALL_FAILED (!) | SYSCALL_FAILED
//
// (!) The exceptions: RAIDIoctlInfo overwrites ERR_DEVICE_ABSENT, and the requests for size and
// rebuild do not distinguish an interruption from other failures. RAIDIoctlStatus also gives
// ERR_SYSCALL_FAILED for a health that is none of the three. After a failure the size is 0 bytes,
// any other result untouched.
int RAIDIoctlInfo(int fd, mdu_array_info_t *pInfo);
int RAIDIoctlSize(int fd, u64 *pcbArray);
int RAIDIoctlStatus(int fd, u32 *pStatus);
int RAIDRebuildStatusGet(int fd, RAID_REBUILD_STATUS *pRebuild);

// What each member contributes, in 512-byte sectors, from sysfs; 0 also when it cannot be read.
u64 RAIDComponentSizeGet(int fd);
