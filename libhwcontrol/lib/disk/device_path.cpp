// SPDX-License-Identifier: MIT
#include "hwcontrol/device_path.h"

#include "nurocore/text.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <string_view>

namespace
{

constexpr char DEVICE_DIRECTORY[] = "/dev/";
constexpr char DEVICE_DIRECTORY_NAME[] = "/dev";

} // namespace

void DevicePathBuild(const char *szName, char *szPath, size_t cbPath)
{
    if (snprintf(szPath, cbPath, "%s%s", DEVICE_DIRECTORY, szName) < 0) {
        szPath[0] = '\0';
    }
}

DEVICE_PATH DevicePathOf(const char *szName)
{
    DEVICE_PATH path;
    DevicePathBuild(szName, path.sz, sizeof(path.sz));
    return path;
}

const char *DeviceNameOf(const char *szPath)
{
    return NLIBCStrSkipPrefix(szPath, DEVICE_DIRECTORY);
}

const char *DeviceNameBehindDev(const char *szPath)
{
    const bool fPath = std::string_view(szPath).starts_with(DEVICE_DIRECTORY_NAME);
    return fPath ? szPath + std::min(strlen(szPath), strlen(DEVICE_DIRECTORY)) : szPath;
}

const char *DeviceNameWithin(const char *szPath)
{
    const char *const pchDirectory = strstr(szPath, DEVICE_DIRECTORY_NAME);
    if (pchDirectory == nullptr) {
        return szPath;
    }
    const char *const pchSlash = strchr(pchDirectory + 1, '/');
    return pchSlash == nullptr ? szPath : pchSlash + 1;
}
