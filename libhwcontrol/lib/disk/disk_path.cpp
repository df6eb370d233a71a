// SPDX-License-Identifier: MIT
#include "hwcontrol/disk_path.h"

#include "hwcontrol/disk_name.h"
#include "hwcontrol/disk_port.h"
#include "nurocore/error.h"
#include "nurocore/log.h"
#include "nurocore/text.h"
#include "nurocore/types.h"

#include <array>
#include <cstring>

namespace
{

constexpr u32 CONTAINER_NONE = 0;

// Indexed by port type.
constexpr std::array<u32, 10> CONTAINERS = {
    CONTAINER_NONE,          // UNKNOWN_DEVICE
    DISK_CONTAINER_INTERNAL, // INTERNAL_DEVICE
    DISK_CONTAINER_ESATA,    // ESATA_DEVICE
    DISK_CONTAINER_EUNIT,    // EUNIT_DEVICE
    DISK_CONTAINER_USB,      // USB_DEVICE
    CONTAINER_NONE,          // BOOT_DEVICE
    CONTAINER_NONE,          // ISD_DEVICE
    DISK_CONTAINER_CACHE,    // CACHE_DEVICE
    DISK_CONTAINER_USB,      // OTHER_DEVICE
    CONTAINER_NONE,          // MMC_DEVICE
};

// Kept: a parsed path has a container even for the port types that DiskContainerFromPortType
// refuses. The boot device and isd disks count as internal, an MMC card as USB.
u32 ParsedContainer(DISK_PORT_TYPE type)
{
    u32 container = DISK_CONTAINER_INTERNAL;
    if (type == MMC_DEVICE) {
        return DISK_CONTAINER_USB;
    }
    if (DiskContainerFromPortType(type, &container) != 0) {
        NLIBCLog(LOG_ERR, "Unknown diskType");
    }
    return container;
}

// Counted from 1, and modulo 2^32 like the index itself.
i32 DiskNumber(const char *szPath)
{
    return static_cast<i32>(static_cast<u32>(DiskIndexGet(szPath)) + 1U);
}

// Disks of an expansion unit are named by unit, then by bay: sdga is the first disk of unit g. A
// name of one letter stands for the unit itself.
void UnitDiskPlace(const char *szPath, const char *szLetters, DISK_PATH_INFO *pInfo)
{
    pInfo->unitIndex = szLetters[0] - 'a' + 1;
    pInfo->diskIndex = strlen(szLetters) == 1 ? pInfo->unitIndex : DiskNumber(szPath);
}

} // namespace

int DiskContainerFromPortType(DISK_PORT_TYPE type, u32 *pMask)
{
    const auto index = static_cast<size_t>(type);
    if (pMask == nullptr || index >= CONTAINERS.size() || CONTAINERS[index] == CONTAINER_NONE) {
        return -1;
    }
    *pMask = CONTAINERS[index];
    return 0;
}

int DiskContainerGet(const char *szPath, u32 *pMask)
{
    if (szPath == nullptr || pMask == nullptr) {
        NLIBCLog(LOG_ERR, "bad paramters");
        return -1;
    }
    return DiskContainerFromPortType(ExternalDiskPortCheck(szPath), pMask);
}

int DiskPathParse(const char *szPath, DISK_PATH_INFO *pInfo)
{
    if (szPath == nullptr || pInfo == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    const DISK_PORT_TYPE type = ExternalDiskPortCheck(szPath);
    if (type == UNKNOWN_DEVICE) {
        NLIBCLog(LOG_ERR, "bad paramters: unknown device, disk path: %s", szPath);
        return -1;
    }
    const char *const szName = DeviceNameOf(szPath);
    char szDisk[DEVICE_NAME_SIZE];
    pInfo->partitionNum = DiskPartitionNumGet(szName, szDisk, sizeof(szDisk));
    pInfo->container = ParsedContainer(type);
    if (type == EUNIT_DEVICE) {
        UnitDiskPlace(szPath, NLIBCStrSkipPrefix(szName, "sd"), pInfo);
    } else {
        pInfo->diskIndex = DiskNumber(szPath);
        pInfo->unitIndex = 0;
    }
    return 0;
}
