// SPDX-License-Identifier: MIT
#pragma once

// What the partitioner knows of the partitions of one disk, and how it reports a failure.

#include <cstdint>

using u32 = std::uint32_t;
using u64 = std::uint64_t;

// All counts are 512-byte sectors, the unit of sysfs, whatever the disk's own sector is.
constexpr u64 SECTOR_SIZE = 512;

// The kernel gives no disk more partitions than this.
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

// Returns 0, or 1 after a line when the list is full.
int PartitionPush(PARTITION_LIST *pList, const PARTITION &partition);

// Writes the one line that a failure is worth to standard error and returns 1, the status that
// the program ends with. Every int function of the partitioner answers 0, or 1 after this line.
[[gnu::format(printf, 1, 2)]] int Complain(const char *szFormat, ...);
