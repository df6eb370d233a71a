// SPDX-License-Identifier: MIT
#include "nurostoragecore/raid_superblock.h"

#include "nurocore/io.h"
#include "nurocore/log.h"
#include "nurocore/pipe.h"
#include "nurocore/text.h"
#include "nurocore/types.h"
#include "nurostoragecore/program_path.h"
#include "nurostoragecore/raid_info.h"

#include <cstdio>
#include <cstring>
#include <string_view>

namespace
{

constexpr int LINE_SIZE = 1024;

struct LEVEL_WORD {
    const char *szWord;
    u32 level;
};

constexpr LEVEL_WORD LEVEL_WORDS[] = {
    {"raid5", RAID_LEVEL_5},   {"raid1", RAID_LEVEL_1}, {"raid0", RAID_LEVEL_0},
    {"raid10", RAID_LEVEL_10}, {"raid6", RAID_LEVEL_6}, {"linear", RAID_LEVEL_LINEAR},
};

int VersionTake(char *szValue, RAID_SUPERBLOCK *pSuperblock)
{
    char *const pchPoint = strchr(szValue, '.');
    if (pchPoint == nullptr) {
        NLIBCLog(LOG_ERR, "bad version format: '%s'.", szValue);
        return -1;
    }
    *pchPoint = '\0';
    pSuperblock->majorVersion = NLIBCStrToI32(szValue);
    pSuperblock->minorVersion = NLIBCStrToI32(pchPoint + 1);
    return 0;
}

// A remark in parentheses may follow the UUID; it is cut off together with the blank before it.
int UuidTake(char *szValue, RAID_SUPERBLOCK *pSuperblock)
{
    char *const pchRemark = strchr(szValue, '(');
    if (pchRemark != nullptr) {
        *(pchRemark == szValue ? pchRemark : pchRemark - 1) = '\0';
    }
    (void)snprintf(pSuperblock->szUuid, sizeof(pSuperblock->szUuid), "%s", szValue);
    return 0;
}

int RaidDevicesTake(char *szValue, RAID_SUPERBLOCK *pSuperblock)
{
    pSuperblock->nRaidDevices = NLIBCStrToI32(szValue);
    return 0;
}

int LevelTake(char *szValue, RAID_SUPERBLOCK *pSuperblock)
{
    // Kept: an unknown level counts as RAID 5; callers expect that.
    pSuperblock->level = RAID_LEVEL_5;
    for (const LEVEL_WORD &row : LEVEL_WORDS) {
        if (strcmp(szValue, row.szWord) == 0) {
            pSuperblock->level = row.level;
        }
    }
    return 0;
}

// "host:2" and a preferred minor of 2 both name /dev/md2.
int MdPathTake(char *szValue, RAID_SUPERBLOCK *pSuperblock)
{
    const char *const pchColon = strrchr(szValue, ':');
    const i32 nMd = NLIBCStrToI32(pchColon == nullptr ? szValue : pchColon + 1);
    (void)snprintf(pSuperblock->szMdPath, sizeof(pSuperblock->szMdPath), "/dev/md%d", nMd);
    return 0;
}

int DeviceRoleTake(char *szValue, RAID_SUPERBLOCK *pSuperblock)
{
    constexpr std::string_view ACTIVE = "Active device ";
    const std::string_view value(szValue);
    if (value.starts_with(ACTIVE)) {
        pSuperblock->deviceRole = NLIBCStrToI32(szValue + ACTIVE.size());
        return 0;
    }
    if (value.starts_with("spare")) {
        pSuperblock->deviceRole = -1;
        return 0;
    }
    NLIBCLog(LOG_ERR, "bad device order format: '%s'.", szValue);
    return -1;
}

int EventsTake(char *szValue, RAID_SUPERBLOCK *pSuperblock)
{
    pSuperblock->events = NLIBCStrToI32(szValue);
    return 0;
}

struct REPORT_KEY {
    const char *szKey;
    int (*pTake)(char *, RAID_SUPERBLOCK *);
};

constexpr REPORT_KEY REPORT_KEYS[] = {
    {"Version", VersionTake},          {"Array UUID", UuidTake},  {"UUID", UuidTake},
    {"Raid Devices", RaidDevicesTake}, {"Raid Level", LevelTake}, {"Name", MdPathTake},
    {"Preferred Minor", MdPathTake},   {"Events", EventsTake},    {"Device Role", DeviceRoleTake},
};

// The row of a 0.90 report that begins with "this": its first number is the device's slot.
int ThisRowTake(char *szRow, RAID_SUPERBLOCK *pSuperblock)
{
    constexpr std::string_view THIS = "this";
    if (!std::string_view(szRow).starts_with(THIS)) {
        return 0;
    }
    char *const szNumbers = szRow + THIS.size();
    if (NLIBCStrTrimSpace(szNumbers, nullptr) < 0) {
        NLIBCLog(LOG_ERR, "Failed to trim val: '%s'.", szNumbers);
        return -1;
    }
    pSuperblock->deviceRole = NLIBCStrToI32(szNumbers);
    return 0;
}

int PairTake(char *szKey, char *szValue, RAID_SUPERBLOCK *pSuperblock)
{
    if (NLIBCStrTrimSpace(szKey, nullptr) < 0 || NLIBCStrTrimSpace(szValue, nullptr) < 0) {
        NLIBCLog(LOG_ERR, "Failed to trim key:'%s' or val: '%s'.", szKey, szValue);
        return -1;
    }
    for (const REPORT_KEY &row : REPORT_KEYS) {
        if (strcmp(szKey, row.szKey) == 0) {
            return row.pTake(szValue, pSuperblock);
        }
    }
    return 0;
}

} // namespace

int RAIDSuperblockLineParse(char *szLine, RAID_SUPERBLOCK *pSuperblock)
{
    char *const pchEnd = strrchr(szLine, '\n');
    if (pchEnd != nullptr) {
        *pchEnd = '\0';
    }
    char *const pchColon = strchr(szLine, ':');
    if (pchColon == nullptr) {
        return ThisRowTake(szLine, pSuperblock);
    }
    *pchColon = '\0';
    return PairTake(szLine, pchColon + 1, pSuperblock);
}

int RAIDSuperblockGet(const char *szDevice, RAID_SUPERBLOCK *pSuperblock)
{
    if (szDevice == nullptr || pSuperblock == nullptr) {
        NLIBCLog(LOG_ERR, "Bad parameters");
        return -1;
    }
    const PIPE_OWNER pReport(NLIBCPopen(MDADM_PATH, "r", "-E", szDevice, nullptr));
    if (pReport == nullptr) {
        NLIBCLog(LOG_ERR, "Fail to do [%s -E %s]", MDADM_PATH, szDevice);
        return -1;
    }
    char szLine[LINE_SIZE];
    int result = 0;
    while (NLIBCFgets(szLine, LINE_SIZE, pReport.get()) != nullptr) {
        if (RAIDSuperblockLineParse(szLine, pSuperblock) != 0) {
            return -1;
        }
        result = 1;
    }
    if (feof(pReport.get()) == 0) {
        // A partial report could be taken for that of an array without a UUID.
        NLIBCLog(LOG_ERR, "Fail to read the report of mdadm -E %s", szDevice);
        return -1;
    }
    return result;
}
