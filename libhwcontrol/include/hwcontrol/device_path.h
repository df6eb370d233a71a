// SPDX-License-Identifier: MIT
#pragma once

// "/dev/" in front of a device's name: the one place where it goes on and comes off. Nothing here
// allocates or fails.

#include <cstddef>

// Longer names and paths are cut; the kernel's names have at most 31 characters.
constexpr size_t DEVICE_NAME_SIZE = 32;
constexpr size_t DEVICE_PATH_SIZE = 32;

struct DEVICE_PATH {
    char sz[DEVICE_PATH_SIZE];
};

// "/dev/" and the name.
DEVICE_PATH DevicePathOf(const char *szName);

// The same into a buffer of the caller's, cut to its size of one byte or more.
void DevicePathBuild(const char *szName, char *szPath, size_t cbPath);

// The name behind a leading "/dev/"; a text that does not begin so is a name already. It is part of
// szPath.
const char *DeviceNameOf(const char *szPath);

// Kept: what begins with "/dev" loses five characters here, whatever the fifth is; partitions have
// always been named so.
const char *DeviceNameBehindDev(const char *szPath);

// Kept: the name behind the first "/dev" and the next "/", wherever they stand; szPath without
// them. Ports have always been told so.
const char *DeviceNameWithin(const char *szPath);
