// SPDX-License-Identifier: MIT
#pragma once

// Changing a disk's partition table with the system's partitioner. Nothing here sets a code of its
// own: a program that ran and failed leaves the last-error record as it was, one that could not be
// started what SpaceExecl says.

#include "nurocore/types.h"

constexpr int PARTITION_KIND_SYSTEM = 1; // system and swap partitions
constexpr int PARTITION_KIND_DATA = 2;   // alone, even when both bits are given

constexpr int PARTITION_CLEAN_SYSTEM = 1; // partitions 1 and 2
constexpr int PARTITION_CLEAN_DATA = 2;   // partitions 3 to 128
constexpr int PARTITION_CLEAN_ALL = 3;

// Makes the partitions of a kind in the layout *pVersion; NULL takes the version the disk has, else
// the machine's. Stops at the first command that fails. Returns 0 or -1.
int PartitionCreate(const char *szDisk, int kind, const u32 *pVersion);

// Deletes partitions. Returns 0 whatever the partitioner says, -1 for a NULL disk.
int PartitionClean(const char *szDisk, int mode);

// Writes an ms-dos signature. Returns 0 or -1.
int PartitionTableAdd(const char *szDisk);

// Wipes the md superblock of one partition. Returns 0 or -1.
int PartitionZeroSuperblock(const char *szDisk, int partNum);

constexpr i64 PARTITION_ABSENT = -1; // all ones

// The size of a partition in sectors, with its start sector in *pStart and its MBR type in *pType;
// PARTITION_ABSENT (nothing stored) when there is none or it cannot be read.
i64 PartitionGeometryGet(int partNum, const char *szDisk, u64 *pStart, u32 *pType);
