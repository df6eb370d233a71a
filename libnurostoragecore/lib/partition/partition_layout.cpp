// SPDX-License-Identifier: MIT
#include "nurostoragecore/partition_layout.h"

#include "attribute/attribute.h"
#include "hwcontrol/disk_name.h"
#include "nurocore/conf.h"
#include "nurocore/error.h"
#include "nurocore/log.h"
#include "nurocore/types.h"
#include "partition/partition_type.h"

#include <array>
#include <cstdio>
#include <cstdlib>
#include <unistd.h>

namespace
{

constexpr int PARTITION_NAME_SIZE = 128;
constexpr int PATH_SIZE = 512;
constexpr int LINE_SIZE = 129; // a line of at most 128 bytes

// The swap partition begins where the system partition ends; the data partition is not fixed.
constexpr PARTITION_LAYOUT Row(u32 version, u32 raid, u64 start, u64 systemSize, u64 swapSize,
                               u64 dataGap)
{
    const u32 typeLinux = raid != 0 ? TYPE_RAID : TYPE_LINUX;
    const u32 typeSwap = raid != 0 ? TYPE_RAID : TYPE_SWAP;
    return {.version = version,
            .raid = raid,
            .systemSize = systemSize,
            .swapSize = swapSize,
            .dataGap = dataGap,
            .partitions = {{start, systemSize, typeLinux},
                           {start + systemSize, swapSize, typeSwap},
                           {PARTITION_NOT_FIXED, PARTITION_NOT_FIXED, typeLinux}},
            .buildinStorage = 0};
}

// With built-in storage all three partitions are fixed, whatever the version.
constexpr PARTITION_LAYOUT BuildinStorageRow(u32 version)
{
    return {.version = version,
            .raid = 0,
            .systemSize = 2097152,
            .swapSize = 5105569,
            .dataGap = 524288,
            .partitions = {{256, 2097152, TYPE_LINUX},
                           {2097408, 5105569, TYPE_LINUX},
                           {7202977, 524288, TYPE_LINUX}},
            .buildinStorage = 1};
}

// These are the product's own values, including the irregular ones: there is no version 4, and
// versions 3 and 5 exist without RAID only. The first row that matches is taken.
constexpr std::array<PARTITION_LAYOUT, 14> LAYOUTS = {
    Row(1, 0, 63, 273042, 787185, 273042),
    Row(2, 0, 63, 4980087, 1044225, 257040),
    Row(3, 0, 63, 530082, 787185, 16002),
    Row(5, 0, 63, 722862, 594405, 16002),
    Row(6, 0, 63, 4980087, 4192965, 257040),
    Row(7, 0, 256, 4980480, 4194304, 262144),
    Row(8, 0, 2048, 4980480, 4194304, 260352),
    Row(1, 1, 63, 1574307, 787185, 273105),
    Row(2, 1, 63, 4980087, 1044225, 257040),
    Row(6, 1, 63, 4980087, 4192965, 257040),
    Row(7, 1, 256, 4980480, 4194304, 262144),
    Row(8, 1, 2048, 4980480, 4194304, 260352),
    BuildinStorageRow(7),
    BuildinStorageRow(8),
};

u32 IsBuildinStorage()
{
    return static_cast<u32>(NLIBCConfKeyIsYes("support_buildin_storage"));
}

// The number that an attribute's first line begins with.
int SectorsRead(const char *szDirectory, const char *szAttr, u64 *pSectors)
{
    char szFile[PATH_SIZE + 8];
    (void)snprintf(szFile, sizeof(szFile), "%s/%s", szDirectory, szAttr);
    char szLine[LINE_SIZE];
    const ssize_t cbRead = AttributeLineRead(szFile, szLine, LINE_SIZE);
    if (cbRead <= ATTRIBUTE_NOT_READ) {
        NLIBCErrSetHere(cbRead == ATTRIBUTE_NOT_OPENED ? ERR_OPEN_FAILED : ERR_READ_FAILED);
        return -1;
    }
    char *pchEnd = nullptr;
    const u64 nSectors = strtoull(szLine, &pchEnd, 10);
    if (pchEnd == szLine) {
        NLIBCErrSetHere(ERR_READ_FAILED);
        return -1;
    }
    *pSectors = nSectors;
    return 0;
}

bool IsAt(const PARTITION_PLACE &place, const PARTITION_PLACE &expected)
{
    return place.start == expected.start && place.size == expected.size;
}

} // namespace

int IsSupportRaid()
{
    static bool fAsked = false;
    static int fSupportRaid = 0;
    if (!fAsked) {
        fSupportRaid = NLIBCConfKeyIsYes("supportraid");
        fAsked = true;
    }
    return fSupportRaid;
}

int PartitionLayoutIndexGet(u32 version, int raid)
{
    const u32 wanted = version == 0 ? PARTITION_LAYOUT_NEWEST : version;
    const u32 fBuildin = IsBuildinStorage();
    for (size_t row = 0; row < LAYOUTS.size(); row++) {
        const PARTITION_LAYOUT &layout = LAYOUTS[row];
        if (layout.version == wanted && layout.raid == static_cast<u32>(raid) &&
            layout.buildinStorage == fBuildin) {
            return static_cast<int>(row);
        }
    }
    return -1;
}

const PARTITION_LAYOUT *PartitionLayoutAt(int row)
{
    return row >= 0 && static_cast<size_t>(row) < LAYOUTS.size()
               ? &LAYOUTS[static_cast<size_t>(row)]
               : nullptr;
}

int PartitionStartSizeGet(const char *szDisk, int partNum, u64 *pStart, u64 *pSize)
{
    if (szDisk == nullptr || pStart == nullptr || pSize == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    const char *const szName = DeviceNameOf(szDisk);
    char szPartition[PARTITION_NAME_SIZE];
    if (DiskDevicePartitionNameGet(szName, partNum, szPartition, PARTITION_NAME_SIZE) != 0) {
        return -1;
    }
    char szDirectory[PATH_SIZE];
    (void)snprintf(szDirectory, sizeof(szDirectory), "/sys/block/%s/%s", szName, szPartition);
    if (access(szDirectory, F_OK) != 0) {
        return 0;
    }
    u64 start = 0;
    u64 size = 0;
    if (SectorsRead(szDirectory, "start", &start) != 0 ||
        SectorsRead(szDirectory, "size", &size) != 0) {
        return -1;
    }
    *pStart = start;
    *pSize = size;
    return 1;
}

int PartitionCheckLayout(const char *szDisk, int raid, u32 *pVersion)
{
    if (szDisk == nullptr) {
        return 0;
    }
    const u32 fBuildin = IsBuildinStorage();
    PARTITION_PLACE places[2] = {};
    for (int partNum = 1; partNum <= 2; partNum++) {
        PARTITION_PLACE &place = places[partNum - 1];
        if (PartitionStartSizeGet(szDisk, partNum, &place.start, &place.size) != 1) {
            NLIBCLog(LOG_DEBUG, "%s: dont contain partition [%d]", szDisk, partNum);
            return 0;
        }
    }
    for (const PARTITION_LAYOUT &layout : LAYOUTS) {
        if (layout.raid != static_cast<u32>(raid) || layout.buildinStorage != fBuildin ||
            !IsAt(places[0], layout.partitions[0]) || !IsAt(places[1], layout.partitions[1])) {
            continue;
        }
        if (pVersion != nullptr) {
            *pVersion = layout.version;
        }
        return 1;
    }
    return 0;
}
