// SPDX-License-Identifier: MIT
#pragma once

// What the examination of a device says of its superblock.

#include "text.h"

#include <map>

struct EXAMINED {
    int result = 0; // 1 read, 0 nothing there, -1 a line that is not understood
    int majorVersion = 0;
    int minorVersion = 0;
    std::string uuid = {};
    std::string mdPath = {};
    unsigned int level = 0;
    int nRaidDevices = 0;
    int deviceRole = 0;
    int events = 0;
    std::string problem = {}; // how that line is logged
};

inline void VersionTake(EXAMINED &examined, const std::string &value)
{
    const size_t point = value.find('.');
    if (point == std::string::npos) {
        examined.problem = "bad version format: '" + value + "'.";
        return;
    }
    examined.majorVersion = Number32(value.substr(0, point));
    examined.minorVersion = Number32(value.substr(point + 1));
}

inline void RoleTake(EXAMINED &examined, const std::string &value)
{
    constexpr std::string_view ACTIVE = "Active device ";
    if (value.starts_with("spare")) {
        examined.deviceRole = -1;
    } else if (value.starts_with(ACTIVE)) {
        examined.deviceRole = Number32(value.substr(ACTIVE.size()));
    } else {
        examined.problem = "bad device order format: '" + value + "'.";
    }
}

// A remark in parentheses goes, and the character before it.
inline std::string UuidOf(const std::string &value)
{
    constexpr size_t LENGTH_MAX = 63;
    const size_t remark = value.find('(');
    const bool fRemark = remark != std::string::npos;
    return value.substr(0, fRemark ? std::max<size_t>(remark, 1) - 1 : remark)
        .substr(0, LENGTH_MAX);
}

inline unsigned int LevelOf(const std::string &value)
{
    static const std::map<std::string, unsigned int> LEVELS = {
        {"raid5", 4}, {"raid1", 2}, {"raid0", 1}, {"raid10", 16}, {"raid6", 8}, {"linear", 32}};
    const auto found = LEVELS.find(value);
    return found == LEVELS.end() ? 4 : found->second;
}

inline void PairTake(EXAMINED &examined, const std::string &key, const std::string &value)
{
    if (key == "Version") {
        VersionTake(examined, value);
    } else if (key == "Device Role") {
        RoleTake(examined, value);
    } else if (key == "Array UUID" || key == "UUID") {
        examined.uuid = UuidOf(value);
    } else if (key == "Raid Level") {
        examined.level = LevelOf(value);
    } else if (key == "Raid Devices") {
        examined.nRaidDevices = Number32(value);
    } else if (key == "Events") {
        examined.events = Number32(value);
    } else if (key == "Name" || key == "Preferred Minor") {
        const std::string number = value.substr(value.rfind(':') + 1); // all of it without one
        examined.mdPath = "/dev/md" + std::to_string(Number32(number));
    }
}

inline EXAMINED ReportRead(std::string_view report)
{
    EXAMINED examined;
    for (const std::string &line : Lines(report, 1024)) {
        const size_t colon = line.find(':');
        if (colon != std::string::npos) {
            PairTake(examined, Trimmed(line.substr(0, colon)), Trimmed(line.substr(colon + 1)));
        } else if (line.starts_with("this")) {
            examined.deviceRole = Number32(Trimmed(line.substr(4)));
        }
        examined.result = examined.problem.empty() ? 1 : -1;
        if (examined.result < 0) {
            break;
        }
    }
    return examined;
}
