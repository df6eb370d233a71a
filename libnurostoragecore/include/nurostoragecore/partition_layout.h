// SPDX-License-Identifier: MIT
#pragma once

// The geometries that the system, swap and data partitions have had over the product's life, and
// which of them a disk carries. Starts and sizes are 512-byte sectors.

#include "nurocore/types.h"

constexpr u32 PARTITION_LAYOUT_NEWEST = 8;
constexpr u64 PARTITION_NOT_FIXED = ~0ULL;

struct PARTITION_PLACE {
    u64 start; // PARTITION_NOT_FIXED when it depends on the disk
    u64 size;
    u32 type; // MBR type code
};

struct PARTITION_LAYOUT {
    u32 version;
    u32 raid; // 1 for machines with RAID support
    u64 systemSize;
    u64 swapSize;
    u64 dataGap; // between the swap partition and the first data partition
    PARTITION_PLACE partitions[3];
    u32 buildinStorage; // 1 for machines with built-in storage
};

// 1 when the model supports RAID, else 0. Read once per process.
int IsSupportRaid();

// The index of the table's row for a version (0 is the newest) on this model, -1 when there is
// none.
int PartitionLayoutIndexGet(u32 version, int raid);

// A row of the table, NULL for an index outside it.
const PARTITION_LAYOUT *PartitionLayoutAt(int row);

// The place of a partition on its disk. Returns 1, 0 when the disk has no such partition, -1 on
// failure: ERR_BAD_PARAMETER for NULL, ERR_OPEN_FAILED, ERR_READ_FAILED, no code when
// DiskDevicePartitionNameGet fails.
int PartitionStartSizeGet(const char *szDisk, int partNum, u64 *pStart, u64 *pSize);

// 1 when partitions 1 and 2 of the disk match a row of the table, with the row's version in
// *pVersion (may be NULL); 0 otherwise.
int PartitionCheckLayout(const char *szDisk, int raid, u32 *pVersion);
