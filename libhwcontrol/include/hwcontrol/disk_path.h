// SPDX-License-Identifier: MIT
#pragma once

// What a disk path says: which disk, in which container, which partition.

#include "hwcontrol/disk_port.h"
#include "nurocore/types.h"

constexpr u32 DISK_CONTAINER_INTERNAL = 1;
constexpr u32 DISK_CONTAINER_EUNIT = 2;
constexpr u32 DISK_CONTAINER_USB = 4;
constexpr u32 DISK_CONTAINER_ESATA = 8;
constexpr u32 DISK_CONTAINER_CACHE = 32;

struct DISK_PATH_INFO {
    i32 diskIndex;    // from 1: sda is 1, sdaa 27
    u32 container;    // one of DISK_CONTAINER_*
    i32 unitIndex;    // expansion unit from 1, by the first letter; 0 for every other disk
    i32 partitionNum; // 0 for a whole disk
};

static_assert(sizeof(DISK_PATH_INFO) == 16);

// The container of a port type. Returns 0, or -1 (no code, mask untouched) for NULL and for a type
// that has none.
int DiskContainerFromPortType(DISK_PORT_TYPE type, u32 *pMask);

// The same for the port type of a path.
int DiskContainerGet(const char *szPath, u32 *pMask);

// Fills *pInfo. Returns 0, or -1: ERR_BAD_PARAMETER for NULL, no code for an unknown device.
int DiskPathParse(const char *szPath, DISK_PATH_INFO *pInfo);
