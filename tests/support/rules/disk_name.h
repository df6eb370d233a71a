// SPDX-License-Identifier: MIT
#pragma once

// What the names of disks and partitions say.

#include "text.h"

#include <cstdint>
#include <cstdio>

inline bool IsMmc(const std::string &name)
{
    return name.find("mmcblk") != std::string::npos;
}

// Letters as digits, wrapping at 32 bits.
inline int DiskIndex(const std::string &path)
{
    std::string name = WithoutDev(path);
    name = name.starts_with("sd") ? name.substr(2) : name;
    std::uint32_t value = UINT32_MAX;
    for (const char letter : name) {
        if (letter < 'a' || letter > 'z') {
            break;
        }
        value = (value + 1) * 26 + static_cast<std::uint32_t>(letter - 'a');
    }
    return static_cast<int>(value);
}

struct DISK_AND_NUMBER {
    std::string disk;
    int number; // 0 for a whole disk, -1 for no name at all
};

// Read with scanf, whose numbers have to fit. The disk's name is cut to a buffer of cbDisk bytes.
inline DISK_AND_NUMBER PartitionNumber(const std::string &name, size_t cbDisk)
{
    std::vector<char> disk(cbDisk, '\0');
    int number = -1;
    char szFormat[32];
    (void)snprintf(szFormat, sizeof(szFormat), IsMmc(name) ? "%%%zu[^p]p%%d" : "%%%zu[^1-9]%%d",
                   cbDisk - 1);
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
    const int nScanned = sscanf(name.c_str(), szFormat, disk.data(), &number);
#pragma GCC diagnostic pop
    if (nScanned < 0) {
        number = -1;
    } else if (disk.data() == name) {
        number = 0;
    }
    return {disk.data(), number};
}

inline std::string WithoutPartitionNumber(const std::string &path)
{
    const size_t last = path.rfind('p');
    if (!IsMmc(path)) {
        return path.substr(0, path.find_first_of("0123456789"));
    }
    const bool fNumber =
        last != std::string::npos && path[last + 1] >= '0' && path[last + 1] <= '9';
    return fNumber ? path.substr(0, last) : path;
}

// Of a name that stands behind "/dev/", or alone.
inline std::string PartitionName(const std::string &path, int number)
{
    const std::string disk =
        path.starts_with("/dev") ? path.substr(std::min<size_t>(5, path.size())) : path;
    const std::string name = disk.substr(0, 31);
    return name + (IsMmc(name) ? "p" : "") + std::to_string(number);
}

inline std::string PartitionPath(const std::string &path, int number)
{
    return "/dev/" + PartitionName(path, number).substr(0, 31);
}
