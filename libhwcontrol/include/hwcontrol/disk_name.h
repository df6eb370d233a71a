// SPDX-License-Identifier: MIT
#pragma once

// Names of block devices: sda, sdaa3, isda, mmcblk0p1, nuroboot, with or without "/dev/" in front.
// No other module adds or removes "/dev/". Nothing here allocates.

#include "nurocore/types.h"

#include <cstddef>

// Longer names and paths are truncated; the kernel's names have at most 31 characters.
constexpr size_t DEVICE_NAME_SIZE = 32;
constexpr size_t DEVICE_PATH_SIZE = 32;

struct DEVICE_PATH {
    char sz[DEVICE_PATH_SIZE];
};

// "/dev/" and the name.
DEVICE_PATH DevicePathOf(const char *szDevice);

// Writes the same path to szPath, truncated to cbPath bytes (at least 1).
void DevicePathBuild(const char *szDevice, char *szPath, size_t cbPath);

// The name after a leading "/dev/", or szDevice itself when it does not begin with that. The result
// points into szDevice.
const char *DeviceNameOf(const char *szDevice);

// Kept: the name after the first "/dev" and the next "/", wherever they occur; szDevice itself when
// either is missing. Port types have always been determined from this name.
const char *DeviceNameWithin(const char *szDevice);

// The number that the letters of a disk stand for: sda 0, sdz 25, sdaa 26; -1 for NULL and for a
// name without letters. It is computed modulo 2^32, so names of other kinds give meaningless, but
// stable, numbers.
int DiskIndexGet(const char *szName);

// Splits a name into disk and partition number. The disk is written to szDisk, truncated to fit;
// the rest of the cbDisk bytes is set to 0. Returns the number, 0 for a whole disk, or -1: no code
// when the name has no disk or no number after it, ERR_BAD_PARAMETER for bad arguments, which leave
// szDisk unchanged.
int DiskPartitionNumGet(const char *szName, char *szDisk, int cbDisk);

// Writes the name without its partition number to szDisk, which must have space for the whole name.
// Returns 0, or -1 (no code).
int DiskPartitionNumRemove(const char *szPart, char *szDisk, int cbDisk);

// Write the name of a disk's partition partNum (1 or more), "sda3" for "/dev/sda"; the path
// function puts "/dev/" in front. Return 0, or -1 (no code).
int DiskDevicePartitionNameGet(const char *szDisk, int partNum, char *szOut, size_t cbOut);
int DiskDevicePartitionPathGet(const char *szDisk, int partNum, char *szOut, size_t cbOut);

// 1 when the device can be opened and has a size, 0 when not, -1 with ERR_BAD_PARAMETER for NULL.
int DiskIsExist(const char *szPath);
