// SPDX-License-Identifier: MIT
#pragma once

// What is read of a partition: the partitioner's listing, and the kernel's numbers.

#include "text.h"

#include <cstdint>
#include <optional>

struct LISTED {
    std::uint64_t start;
    std::int64_t nSectors;
    std::uint32_t type;
};

// None unless the first line has the five fields of a partition.
inline std::optional<LISTED> ListingRead(std::string_view listing)
{
    const std::vector<std::string> fields = Words(FirstLine(listing, 257), " \t");
    if (fields.size() < 5) {
        return {};
    }
    return LISTED{strtoull(fields[1].c_str(), nullptr, 10), strtoll(fields[3].c_str(), nullptr, 10),
                  static_cast<std::uint32_t>(strtoul(fields[4].c_str(), nullptr, 16))};
}

// A start or a size of sysfs; none when the file begins with something else.
inline std::optional<std::uint64_t> SectorsRead(std::string_view file)
{
    const std::string line = FirstLine(file, 129);
    char *pEnd = nullptr;
    const std::uint64_t nSectors = strtoull(line.c_str(), &pEnd, 10);
    return pEnd == line.c_str() ? std::nullopt : std::optional(nSectors);
}
