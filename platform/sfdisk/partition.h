// SPDX-License-Identifier: MIT
#pragma once

// The record of a disk's partitions, and how the partitioner reports a failure.

#include <cstdint>

using u32 = std::uint32_t;
using u64 = std::uint64_t;

// All counts are 512-byte sectors, the unit of sysfs, whatever the disk's own sector size is.
constexpr u64 SECTOR_SIZE = 512;

// The kernel makes no more partitions than this on a disk.
constexpr int PARTITION_MAX = 256;

struct PARTITION {
    int number;
    u64 start;
    u64 sectors;
    u32 type;
    bool fContainer; // an extended partition, which holds the logical ones
};

struct PARTITION_LIST {
    int nItem;
    PARTITION items[PARTITION_MAX];
};

// Both return NULL when there is none.
const PARTITION *PartitionFind(const PARTITION_LIST *pList, int number);
const PARTITION *PartitionAtSector(const PARTITION_LIST *pList, u64 sector);

// Returns 0, or 1 after a message when the list is full.
int PartitionPush(PARTITION_LIST *pList, const PARTITION &partition);

// Writes one line about a failure to standard error and returns 1, the program's exit status. Every
// int function of the partitioner returns 0, or 1 after such a line.
[[gnu::format(printf, 1, 2)]] int Complain(const char *szFormat, ...);
