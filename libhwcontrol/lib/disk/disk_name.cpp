// SPDX-License-Identifier: MIT
#include "hwcontrol/disk_name.h"

#include "nurocore/error.h"
#include "nurocore/handle.h"
#include "nurocore/log.h"
#include "nurocore/text.h"
#include "nurocore/types.h"

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <linux/fs.h>
#include <string_view>
#include <sys/ioctl.h>

namespace
{

constexpr char DEVICE_DIRECTORY[] = "/dev/";
constexpr char DEVICE_DIRECTORY_NAME[] = "/dev";
constexpr char SD_PREFIX[] = "sd";
constexpr char MMC_NAME[] = "mmcblk";
constexpr char BOOT_NAME[] = "nuroboot";

bool IsMmc(const char *szName)
{
    return strstr(szName, MMC_NAME) != nullptr;
}

bool IsDecimal(char ch)
{
    return ch >= '0' && ch <= '9';
}

// The number at the start of szText as scanf's %d reads it; -1 when there is none.
int ScanNumber(const char *szText)
{
    const char *pch = szText + strspn(szText, " \t\n\v\f\r");
    pch += *pch == '+' || *pch == '-' ? 1 : 0;
    return IsDecimal(*pch) ? NLIBCStrToI32(szText) : -1;
}

// The length of the disk's part of a name. In an mmcblk name it ends at the last "p" if a digit
// follows; in any other at the first digit.
size_t DiskLength(const char *szPart)
{
    if (!IsMmc(szPart)) {
        return strcspn(szPart, "0123456789");
    }
    const char *const pchLast = strrchr(szPart, 'p');
    const bool fNumber = pchLast != nullptr && IsDecimal(pchLast[1]);
    return fNumber ? static_cast<size_t>(pchLast - szPart) : strlen(szPart);
}

bool IsPartitionRequestValid(const char *szDisk, int partNum, const char *szOut, size_t cbOut)
{
    if (cbOut == 0 || szOut == nullptr || szDisk == nullptr || partNum <= 0) {
        NLIBCLog(LOG_ERR, "out put szPartitionPath can not be NULL and path length can't be zero");
        return false;
    }
    return true;
}

// Kept: a text that begins with "/dev" loses five characters, whatever the fifth is; partition
// names have always been made this way.
const char *DeviceNameBehindDev(const char *szDevice)
{
    const bool fPath = std::string_view(szDevice).starts_with(DEVICE_DIRECTORY_NAME);
    return fPath ? szDevice + std::min(strlen(szDevice), strlen(DEVICE_DIRECTORY)) : szDevice;
}

} // namespace

void DevicePathBuild(const char *szDevice, char *szPath, size_t cbPath)
{
    if (snprintf(szPath, cbPath, "%s%s", DEVICE_DIRECTORY, szDevice) < 0) {
        szPath[0] = '\0';
    }
}

DEVICE_PATH DevicePathOf(const char *szDevice)
{
    DEVICE_PATH path = {};
    DevicePathBuild(szDevice, path.sz, sizeof(path.sz));
    return path;
}

const char *DeviceNameOf(const char *szDevice)
{
    const bool fPath = std::string_view(szDevice).starts_with(DEVICE_DIRECTORY);
    return fPath ? szDevice + strlen(DEVICE_DIRECTORY) : szDevice;
}

const char *DeviceNameWithin(const char *szDevice)
{
    const char *const pchDirectory = strstr(szDevice, DEVICE_DIRECTORY_NAME);
    if (pchDirectory == nullptr) {
        return szDevice;
    }
    const char *const pchSlash = strchr(pchDirectory + 1, '/');
    return pchSlash == nullptr ? szDevice : pchSlash + 1;
}

int DiskIndexGet(const char *szName)
{
    if (szName == nullptr) {
        return -1;
    }
    u32 index = ~0U;
    const char *pch = NLIBCStrSkipPrefix(DeviceNameOf(szName), SD_PREFIX);
    for (; *pch >= 'a' && *pch <= 'z'; pch++) {
        index = (index + 1U) * 26U + static_cast<u32>(*pch - 'a');
    }
    return static_cast<i32>(index);
}

int DiskPartitionNumGet(const char *szName, char *szDisk, int cbDisk)
{
    if (szName == nullptr || szDisk == nullptr || cbDisk <= 0) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    // Kept: here the disk ends at the first digit from 1 to 9 (an mmcblk disk at the first "p"),
    // while DiskPartitionNumRemove ends it at any digit.
    const bool fMmc = IsMmc(szName);
    const size_t cchDisk =
        std::min(strcspn(szName, fMmc ? "p" : "123456789"), static_cast<size_t>(cbDisk) - 1);
    memset(szDisk, 0, static_cast<size_t>(cbDisk));
    memcpy(szDisk, szName, cchDisk);
    if (cchDisk == 0) {
        return -1;
    }
    const char *pchNumber = szName + cchDisk;
    if (*pchNumber == '\0') {
        return 0;
    }
    if (fMmc && *pchNumber++ != 'p') {
        return -1;
    }
    return ScanNumber(pchNumber);
}

int DiskPartitionNumRemove(const char *szPart, char *szDisk, int cbDisk)
{
    if (szPart == nullptr || szDisk == nullptr || cbDisk <= 0) {
        NLIBCLog(LOG_DEBUG, "Bad parameters");
        return -1;
    }
    if (static_cast<size_t>(cbDisk) < strlen(szPart) + 1) {
        NLIBCLog(LOG_ERR, "buffer size of szDiskPath should be longer than string length of "
                          "szPartPath");
        return -1;
    }
    const size_t cchDisk = DiskLength(szPart);
    memmove(szDisk, szPart, cchDisk);
    szDisk[cchDisk] = '\0';
    return 0;
}

int DiskDevicePartitionNameGet(const char *szDisk, int partNum, char *szOut, size_t cbOut)
{
    if (!IsPartitionRequestValid(szDisk, partNum, szOut, cbOut)) {
        return -1;
    }
    char szName[DEVICE_NAME_SIZE];
    (void)snprintf(szName, sizeof(szName), "%s", DeviceNameBehindDev(szDisk));
    if (std::string_view(szName).starts_with(BOOT_NAME)) {
        NLIBCLog(LOG_ERR, "we don't generate nuroboot partition name here");
        return -1;
    }
    (void)snprintf(szOut, cbOut, "%s%s%d", szName, IsMmc(szName) ? "p" : "", partNum);
    return 0;
}

int DiskDevicePartitionPathGet(const char *szDisk, int partNum, char *szOut, size_t cbOut)
{
    if (!IsPartitionRequestValid(szDisk, partNum, szOut, cbOut)) {
        return -1;
    }
    char szName[DEVICE_NAME_SIZE];
    if (DiskDevicePartitionNameGet(szDisk, partNum, szName, sizeof(szName)) != 0) {
        NLIBCLog(LOG_ERR, "fail to get device partition name");
        return -1;
    }
    DevicePathBuild(szName, szOut, cbOut);
    return 0;
}

int DiskIsExist(const char *szPath)
{
    if (szPath == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    const FD_OWNER fd(open(szPath, O_RDONLY | O_CLOEXEC));
    if (!fd) {
        if (errno != ENXIO) {
            NLIBCLog(LOG_ERR, "Failed to open %s, errno=%m", szPath);
        }
        return 0;
    }
    u64 cbDisk = 0;
    if (ioctl(fd.get(), BLKGETSIZE64, &cbDisk) != 0) {
        NLIBCLog(LOG_ERR, "Failed to ioctl %s, errno=%m", szPath);
        return 0;
    }
    return 1;
}
