// SPDX-License-Identifier: MIT
#pragma once

// Changes a disk's partition table with the system's partitioner. Nothing here sets a code of its
// own: when a program ran and failed, the last-error record is unchanged; when it could not be
// started, the record is that of SpaceExecl.

#include "nurocore/types.h"

constexpr int PARTITION_KIND_SYSTEM = 1; // system and swap partitions
constexpr int PARTITION_KIND_DATA = 2;   // takes precedence when both bits are given

constexpr int PARTITION_CLEAN_SYSTEM = 1; // partitions 1 and 2
constexpr int PARTITION_CLEAN_DATA = 2;   // partitions 3 to 128
constexpr int PARTITION_CLEAN_ALL = 3;

// Creates the partitions of a kind in layout version *pVersion; with NULL in the version that the
// disk has, else in the machine's. Stops at the first command that fails. Returns 0 or -1.
int PartitionCreate(const char *szDisk, int kind, const u32 *pVersion);

// Deletes the partitions of a mode (PARTITION_CLEAN_*), then calls PartitionTableAdd. Returns 0
// whether the partitioner succeeds or not, -1 for a NULL disk.
int PartitionClean(const char *szDisk, int mode);

// Writes an ms-dos signature. Returns 0 or -1.
int PartitionTableAdd(const char *szDisk);

// Wipes the md superblock of one partition. Returns 0 or -1.
int PartitionZeroSuperblock(const char *szDisk, int partNum);

constexpr i64 PARTITION_ABSENT = -1; // all ones

// The size of a partition in sectors, with its start sector in *pStart and its MBR type in *pType;
// PARTITION_ABSENT (nothing stored) when there is none or it cannot be read.
i64 PartitionGeometryGet(int partNum, const char *szDisk, u64 *pStart, u32 *pType);
