// SPDX-License-Identifier: MIT
#pragma once

// Which port a disk hangs on.

#include "disk_name.h"

#include <array>
#include <cctype>

enum PORT {
    PORT_UNKNOWN = 0,
    PORT_INTERNAL = 1,
    PORT_ESATA = 2,
    PORT_EUNIT = 3,
    PORT_USB = 4,
    PORT_BOOT = 5,
    PORT_ISD = 6,
    PORT_CACHE = 7,
    PORT_OTHER = 8,
    PORT_MMC = 9
};

// The masks of the configuration file, in the order in which they are read.
enum MASK { MASK_USB, MASK_ESATA, MASK_INTERNAL, MASK_CACHE, MASK_COUNT };
using PORT_MASKS = std::array<std::uint64_t, MASK_COUNT>;
inline constexpr const char *MASK_KEYS[MASK_COUNT] = {"usbportcfg", "esataportcfg",
                                                      "internalportcfg", "cacheportcfg"};

// The names of the list that one host reports of the expansion unit behind it.
inline std::vector<std::string> UnitNames(const std::string &list)
{
    constexpr size_t LETTERS = 15;
    std::vector<std::string> names;
    for (size_t at = 0; list.compare(at, 5, "/dev/") == 0;) {
        size_t end = at += 5;
        while (end < list.size() && end - at < LETTERS &&
               isalpha(static_cast<unsigned char>(list[end])) != 0) {
            end++;
        }
        if (end == at) {
            break;
        }
        names.push_back(list.substr(at, end - at));
        if (end == list.size() || list[end] != ',') {
            break;
        }
        at = end + 1;
    }
    return names;
}

inline std::uint32_t Bit32(int shift)
{
    return shift < 0 || shift > 31 ? 0 : std::uint32_t{1} << shift;
}

inline bool IsOnEsata(const PORT_MASKS &masks, const std::string &name)
{
    const int index = DiskIndex(name);
    const std::uint32_t bit = Bit32(index <= 25 ? index : index / 26 - 1);
    return (static_cast<std::uint32_t>(masks[MASK_ESATA]) & bit) != 0;
}

// Of a disk "sd...". The units' names are those of all hosts, each with a blank behind it.
inline PORT PortOfName(const PORT_MASKS &masks, const std::string &name, const std::string &units)
{
    if (IsOnEsata(masks, name)) {
        return units.find(name) != std::string::npos ? PORT_EUNIT : PORT_ESATA;
    }
    // The bit is a signed 32-bit value: the last one spreads over the upper half.
    const auto bit32 = static_cast<std::int32_t>(Bit32(DiskIndex(name)));
    const auto bit = static_cast<std::uint64_t>(static_cast<std::int64_t>(bit32));
    if ((masks[MASK_INTERNAL] & bit) != 0) {
        return PORT_INTERNAL;
    }
    if ((masks[MASK_USB] & bit) != 0) {
        return PORT_USB;
    }
    return (masks[MASK_CACHE] & bit) != 0 ? PORT_CACHE : PORT_OTHER;
}

// What stands behind "/dev" and the next slash, wherever they are.
inline std::string NameWithin(const std::string &path)
{
    const size_t folder = path.find("/dev");
    return folder == std::string::npos ? path : path.substr(path.find('/', folder + 1) + 1);
}

// Of a disk or a partition, with or without "/dev/", and no longer than a name can be.
inline PORT PortOfPath(const PORT_MASKS &masks, const std::string &path, const std::string &units)
{
    if (IsMmc(path)) {
        return PORT_MMC;
    }
    const std::string name = NameWithin(WithoutPartitionNumber(path));
    if (name.starts_with("nuroboot")) {
        return PORT_BOOT;
    }
    if (name.starts_with("isd")) {
        return PORT_ISD;
    }
    return name.starts_with("sd") ? PortOfName(masks, name, units) : PORT_UNKNOWN;
}

// 0 for a port that is none of a container's.
inline std::uint32_t ContainerOf(PORT port)
{
    constexpr std::uint32_t CONTAINERS[] = {0, 1, 8, 2, 4, 0, 0, 32, 4, 0};
    return CONTAINERS[port];
}
