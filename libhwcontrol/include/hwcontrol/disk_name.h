// SPDX-License-Identifier: MIT
#pragma once

// Names of block devices: sda, sdaa3, isda, mmcblk0p1, nuroboot. Everywhere with or without
// "/dev/" in front. Nothing here allocates.

#include "nurocore/types.h"

#include <cstddef>

// The number that the letters of a disk stand for: sda 0, sdz 25, sdaa 26; -1 without letters. It
// is computed modulo 2^32, so names of another kind give odd, but always the same, numbers.
int DiskIndexGet(const char *szName);

// Splits a name into disk (written to szDisk) and partition number. Returns the number, 0 for a
// whole disk, -1 when there is nothing to split, with ERR_BAD_PARAMETER for bad arguments.
int DiskPartitionNumGet(const char *szName, char *szDisk, int cbDisk);

// Writes the name without its partition number to szDisk, which holds the whole name at least.
// Returns 0, or -1 (no code).
int DiskPartitionNumRemove(const char *szPart, char *szDisk, int cbDisk);

// Writes the name of a disk's partition partNum (1 or more): "sda3" from "/dev/sda"; the path
// function puts "/dev/" in front. Returns 0, or -1 (no code).
int DiskDevicePartitionNameGet(const char *szDisk, int partNum, char *szOut, size_t cbOut);
int DiskDevicePartitionPathGet(const char *szDisk, int partNum, char *szOut, size_t cbOut);

// 1 when the device can be opened and has a size, 0 when not, -1 with ERR_BAD_PARAMETER for NULL.
int DiskIsExist(const char *szPath);
