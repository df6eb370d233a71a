// SPDX-License-Identifier: MIT
#include "nurostoragecore/raid_add.h"

#include "nurocore/log.h"
#include "nurocore/types.h"
#include "nurostoragecore/program_path.h"
#include "nurostoragecore/raid_info.h"
#include "nurostoragecore/space.h"
#include "raid/raid_owner.h"
#include "space/command_text.h"

#include <cstddef>

namespace
{

constexpr size_t COMMAND_TEXT_SIZE = 512;
constexpr u32 LEVELS_WITH_REDUNDANCY = RAID_LEVEL_1 | RAID_LEVEL_5 | RAID_LEVEL_6 | RAID_LEVEL_10;

// Runs the command; if it fails, logs its words and result.
int AddCommandRun(const char *const argv[])
{
    const int result = SpaceExecv(argv);
    if (result == 0) {
        return 0;
    }
    char szCommand[COMMAND_TEXT_SIZE];
    CommandTextBuild(argv, COMMAND_TEXT_SIZE, szCommand, sizeof(szCommand));
    NLIBCLog(LOG_ERR, "Failed to '%s', ret = %d", szCommand, result);
    return -1;
}

} // namespace

int RAIDParityDiskCount(u32 level, int nDisks)
{
    switch (level) {
    case RAID_LEVEL_0:
    case RAID_LEVEL_LINEAR:
        return 0;
    case RAID_LEVEL_1:
        return nDisks - 1;
    case RAID_LEVEL_5:
        return 1;
    case RAID_LEVEL_6:
        return 2;
    case RAID_LEVEL_10:
        return nDisks / 2;
    default:
        NLIBCLog(LOG_DEBUG, "bad parameters: unknown raid level='%d'", static_cast<int>(level));
        return -1;
    }
}

int RAIDAdd(const char *szMd, const char *szDisk)
{
    if (szMd == nullptr || szDisk == nullptr) {
        NLIBCLog(LOG_ERR, "Bad parameters");
        return -1;
    }
    RAID_INFO *pFound = nullptr;
    const int found = RAIDInfoGet(szMd, &pFound);
    const RAID_INFO_OWNER pInfo(pFound);
    if (found <= 0) {
        NLIBCLog(LOG_ERR, "Failed to get RAID '%s' info. Can not add disk into it. ", szMd);
        return -1;
    }
    if ((pInfo->level & LEVELS_WITH_REDUNDANCY) != 0) {
        const char *const argv[] = {MDADM_PATH, szMd, "-a", szDisk, nullptr};
        return AddCommandRun(argv);
    }
    if (pInfo->level == RAID_LEVEL_LINEAR) {
        const char *const argv[] = {MDADM_PATH, "--grow", szMd, "-a", szDisk, nullptr};
        return AddCommandRun(argv);
    }
    NLIBCLog(LOG_ERR, "Bad raid level to add disk: %d", static_cast<int>(pInfo->level));
    return -1;
}
