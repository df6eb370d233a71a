// SPDX-License-Identifier: MIT
#include "nurostoragecore/partition_edit.h"

#include "hwcontrol/disk_name.h"
#include "nurocore/io.h"
#include "nurocore/log.h"
#include "nurocore/pipe.h"
#include "nurocore/text.h"
#include "nurocore/types.h"
#include "nurostoragecore/partition_layout.h"
#include "nurostoragecore/partition_version.h"
#include "nurostoragecore/program_path.h"
#include "nurostoragecore/space.h"
#include "partition/partition_type.h"
#include "space/command_text.h"

#include <array>
#include <cstdio>
#include <cstdlib>

namespace
{

constexpr size_t OPTION_SIZE = 32;
constexpr size_t COMMAND_TEXT_SIZE = 512;
constexpr size_t ARGUMENT_TEXT_MAX = 256; // characters of one argument in the log
constexpr size_t PATH_SIZE = 128;
constexpr size_t LISTED_PATH_SIZE = 64;
constexpr int LISTED_LINE_SIZE = 257; // a line of at most 256 bytes

// Logged in place of a command's result by steps that have none.
constexpr int RESULT_TABLE_NOT_ADDED = 255;
constexpr int RESULT_NO_KIND = -1;

constexpr int PARTITION_DATA = 3;

struct OPTION {
    char szText[OPTION_SIZE];
};

OPTION SizeOption(const char *szName, u64 nSectors)
{
    OPTION option;
    (void)snprintf(option.szText, OPTION_SIZE, "%s%llu", szName,
                   static_cast<unsigned long long>(nSectors));
    return option;
}

// The types in the layout table are not used for this; the model decides.
OPTION TypeOption(u32 typeWithoutRaid)
{
    OPTION option;
    (void)snprintf(option.szText, OPTION_SIZE, "-t%x",
                   IsSupportRaid() != 0 ? TYPE_RAID : typeWithoutRaid);
    return option;
}

OPTION NumberOption(int partNum)
{
    OPTION option;
    (void)snprintf(option.szText, OPTION_SIZE, "-N%d", partNum);
    return option;
}

int CommandFailed(const char *const argv[], int result)
{
    char szCommand[COMMAND_TEXT_SIZE];
    CommandTextBuild(argv, ARGUMENT_TEXT_MAX, szCommand, sizeof(szCommand));
    NLIBCLog(LOG_ERR, "Failed to [%s], err=%d", szCommand, result);
    return -1;
}

int PartitionFailed(const char *szDisk, int result)
{
    NLIBCLog(LOG_ERR, "Failed to partition disk %s, err=%d", szDisk, result);
    return -1;
}

int DataPartitionCreate(const char *szDisk, const PARTITION_LAYOUT &layout)
{
    const OPTION number = NumberOption(PARTITION_DATA);
    const OPTION gap = SizeOption("-j", layout.dataGap);
    const OPTION type = TypeOption(TYPE_LINUX);
    // Kept: the empty argument. The partitioner treats its position as that of an option.
    const char *const argv[] = {SFDISK_PATH, number.szText, "",          "-uS", "-q",   "-f",
                                gap.szText,  "-z-1",        type.szText, "-F",  szDisk, nullptr};
    const int result = SpaceExecv(argv);
    return result == 0 ? 0 : CommandFailed(argv, result);
}

int SystemPartitionsCreate(const char *szDisk, const PARTITION_LAYOUT &layout)
{
    if (PartitionTableAdd(szDisk) != 0) {
        return PartitionFailed(szDisk, RESULT_TABLE_NOT_ADDED);
    }
    const OPTION start = SizeOption("-j", layout.partitions[0].start);
    const OPTION systemSize = SizeOption("-z", layout.systemSize);
    const OPTION systemType = TypeOption(TYPE_LINUX);
    int result = SpaceExecl(SFDISK_PATH, "-N1", "-uS", "-q", "-f", start.szText, systemSize.szText,
                            systemType.szText, "-F", szDisk, nullptr);
    if (result != 0) {
        return PartitionFailed(szDisk, result);
    }
    const OPTION swapSize = SizeOption("-z", layout.swapSize);
    const OPTION swapType = TypeOption(TYPE_SWAP);
    const char *const argv[] = {SFDISK_PATH,     "-N2",           "-uS", "-q",   "-f",   "-j0",
                                swapSize.szText, swapType.szText, "-F",  szDisk, nullptr};
    result = SpaceExecv(argv);
    return result == 0 ? 0 : CommandFailed(argv, result);
}

// The version asked for, else the disk's own, else the machine's.
bool VersionChoose(const char *szDisk, const u32 *pWanted, u32 *pVersion)
{
    if (pWanted != nullptr) {
        *pVersion = *pWanted;
        return true;
    }
    return PartitionCheckLayout(szDisk, IsSupportRaid(), pVersion) == 1 ||
           PartitionLayoutGet(pVersion) == 0;
}

struct CLEAN_RANGE {
    int mode;
    const char *szRange;
};

constexpr CLEAN_RANGE CLEAN_RANGES[] = {
    {PARTITION_CLEAN_SYSTEM, "1:2"},
    {PARTITION_CLEAN_DATA, "3:128"},
    {PARTITION_CLEAN_ALL, "-1"},
};

const char *RangeOf(int mode)
{
    for (const CLEAN_RANGE &row : CLEAN_RANGES) {
        if (row.mode == mode) {
            return row.szRange;
        }
    }
    return "";
}

// Fields of a listed partition.
enum { LISTED_START = 1, LISTED_SECTORS = 3, LISTED_TYPE = 4, LISTED_COUNT = 5 };

i64 ListedLineParse(char *szLine, u64 *pStart, u32 *pType)
{
    std::array<const char *, LISTED_COUNT> fields = {};
    char *pszCursor = szLine;
    for (const char *&pszField : fields) {
        pszField = NLIBCStrSepNonEmpty(&pszCursor, " \t");
        if (pszField == nullptr) {
            return PARTITION_ABSENT;
        }
    }
    *pStart = strtoull(fields[LISTED_START], nullptr, 10);
    *pType = static_cast<u32>(strtoul(fields[LISTED_TYPE], nullptr, 16));
    return strtoll(fields[LISTED_SECTORS], nullptr, 10);
}

} // namespace

int PartitionCreate(const char *szDisk, int kind, const u32 *pVersion)
{
    if (szDisk == nullptr) {
        NLIBCLog(LOG_ERR, "Bad parameters");
        return -1;
    }
    u32 version = 0;
    if (!VersionChoose(szDisk, pVersion, &version)) {
        NLIBCLog(LOG_ERR, "Failed to get partition version");
        return -1;
    }
    const PARTITION_LAYOUT *const pLayout =
        PartitionLayoutAt(PartitionLayoutIndexGet(version, IsSupportRaid()));
    if (pLayout == nullptr) {
        NLIBCLog(LOG_ERR, "Failed to get partition layout: version=%d", static_cast<int>(version));
        return -1;
    }
    if ((kind & PARTITION_KIND_DATA) != 0) {
        return DataPartitionCreate(szDisk, *pLayout);
    }
    if ((kind & PARTITION_KIND_SYSTEM) != 0) {
        return SystemPartitionsCreate(szDisk, *pLayout);
    }
    const char *const NO_COMMAND[] = {nullptr};
    return CommandFailed(NO_COMMAND, RESULT_NO_KIND);
}

int PartitionClean(const char *szDisk, int mode)
{
    if (szDisk == nullptr) {
        NLIBCLog(LOG_ERR, "Bad parameters");
        return -1;
    }
    const char *const szRange = RangeOf(mode);
    if (SpaceExecl(SFDISK_PATH, "--fast-delete", szRange, szDisk, nullptr) != 0) {
        NLIBCLog(LOG_DEBUG, "Failed to do '%s --fast-delete %s %s'", SFDISK_PATH, szRange, szDisk);
    }
    // Whether or not the partitions could be deleted, the disk should have a table afterwards.
    (void)PartitionTableAdd(szDisk);
    return 0;
}

int PartitionTableAdd(const char *szDisk)
{
    if (szDisk == nullptr) {
        NLIBCLog(LOG_ERR, "Bad parameters");
        return -1;
    }
    const int result = SpaceExecl(SFDISK_PATH, "-M1", szDisk, nullptr);
    if (result != 0) {
        NLIBCLog(LOG_ERR, "Failed to add ms-dos signature to %s, err=%d", szDisk, result);
        return -1;
    }
    return 0;
}

int PartitionZeroSuperblock(const char *szDisk, int partNum)
{
    if (szDisk == nullptr || partNum <= 0) {
        NLIBCLog(LOG_ERR, "Bad parameters");
        return -1;
    }
    char szPartition[PATH_SIZE];
    if (DiskDevicePartitionPathGet(szDisk, partNum, szPartition, PATH_SIZE) != 0) {
        return -1;
    }
    return SpaceExecl(MDADM_PATH, "--zero-superblock", szPartition, nullptr) == 0 ? 0 : -1;
}

i64 PartitionGeometryGet(int partNum, const char *szDisk, u64 *pStart, u32 *pType)
{
    if (partNum <= 0 || szDisk == nullptr || pStart == nullptr || pType == nullptr) {
        return PARTITION_ABSENT;
    }
    const OPTION number = NumberOption(partNum);
    char szPath[LISTED_PATH_SIZE];
    DevicePathBuild(DeviceNameOf(szDisk), szPath, sizeof(szPath));
    const PIPE_OWNER pListing(
        NLIBCPopen(SFDISK_PATH, "r", "-l", "-uS", number.szText, szPath, nullptr));
    char szLine[LISTED_LINE_SIZE];
    if (pListing == nullptr || NLIBCFgets(szLine, LISTED_LINE_SIZE, pListing.get()) == nullptr) {
        return PARTITION_ABSENT;
    }
    return ListedLineParse(szLine, pStart, pType);
}
