// SPDX-License-Identifier: MIT
#pragma once

// Names of block devices: sda, sdaa3, isda, mmcblk0p1, nuroboot. Everywhere with or without
// "/dev/" in front, which goes on and comes off here and nowhere else. Nothing here allocates.

#include "nurocore/types.h"

#include <cstddef>

// Longer names and paths are cut; the kernel's names have at most 31 characters.
constexpr size_t DEVICE_NAME_SIZE = 32;
constexpr size_t DEVICE_PATH_SIZE = 32;

struct DEVICE_PATH {
    char sz[DEVICE_PATH_SIZE];
};

// "/dev/" and the name.
DEVICE_PATH DevicePathOf(const char *szDevice);

// The same into a buffer of the caller's, cut to its size of one byte or more.
void DevicePathBuild(const char *szDevice, char *szPath, size_t cbPath);

// The name behind a leading "/dev/"; a text that does not begin so is a name already. It is part of
// szDevice.
const char *DeviceNameOf(const char *szDevice);

// Kept: the name behind the first "/dev" and the next "/", wherever they stand; szDevice
// without them. Ports have always been told so.
const char *DeviceNameWithin(const char *szDevice);

// The number that the letters of a disk stand for: sda 0, sdz 25, sdaa 26; -1 without letters. It
// is computed modulo 2^32, so names of another kind give odd, but always the same, numbers.
int DiskIndexGet(const char *szName);

// Splits a name into disk and partition number. The disk is written to szDisk, cut to its size; the
// rest of the cbDisk bytes is 0. Returns the number, 0 for a whole disk, -1 when there is nothing
// to split (no code) and with ERR_BAD_PARAMETER for bad arguments, which leave szDisk as it was.
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
