// SPDX-License-Identifier: MIT
#include "nurostoragecore/raid_system.h"

#include "hwcontrol/disk_name.h"
#include "nurocore/conf.h"
#include "nurocore/error.h"
#include "nurocore/keyvalue.h"
#include "nurocore/log.h"
#include "nurocore/types.h"
#include "nurostoragecore/raid_disk.h"
#include "nurostoragecore/raid_info.h"

namespace
{

constexpr int DISK_NAME_SIZE = 128;
constexpr u32 STATES_TO_REPAIR = DISK_STATE_NONE | DISK_STATE_FAILED | DISK_STATE_CRASHING;

enum { PAIR_ROOT, PAIR_SWAP };

bool IsPairValid(RAID_INFO *const *ppPair, const char *szDisk)
{
    if (ppPair == nullptr || ppPair[PAIR_ROOT] == nullptr || ppPair[PAIR_SWAP] == nullptr ||
        szDisk == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return false;
    }
    return true;
}

// Returns the result of RAIDDiskListSearch, with the member's state, if any, in *pState.
int MemberStateGet(const RAID_INFO *pInfo, const char *szDisk, u32 *pState)
{
    RAID_DISK *pMember = nullptr;
    const int found = RAIDDiskListSearch(pInfo->pDisks, szDisk, &pMember);
    *pState = found == 1 ? pMember->state : DISK_STATE_NONE;
    return found;
}

bool IsToRepair(u32 state)
{
    return (state & STATES_TO_REPAIR) != 0;
}

u32 SystemStateOf(u32 rootState, u32 swapState)
{
    const int fNoSwap = NLIBCFileCheckKeyValue(NUROINFO_CONF_PATH, "no_disk_swap", "yes", 0);
    if (IsToRepair(rootState) || (fNoSwap == 0 && IsToRepair(swapState))) {
        return DISK_STATE_FAILED;
    }
    return DISK_STATE_NORMAL;
}

} // namespace

void RAIDInfoPairFree(RAID_INFO **ppPair)
{
    if (ppPair == nullptr) {
        return;
    }
    for (int i = PAIR_ROOT; i <= PAIR_SWAP; i++) {
        RAIDInfoFree(ppPair[i]);
        ppPair[i] = nullptr;
    }
}

int RAIDSystemDiskStatusDetailGet(RAID_INFO *const *ppPair, const char *szDisk, u32 *pRootState,
                                  u32 *pSwapState)
{
    if (!IsPairValid(ppPair, szDisk) || pRootState == nullptr || pSwapState == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    char szWhole[DISK_NAME_SIZE];
    const char *const szSearched =
        DiskPartitionNumRemove(szDisk, szWhole, DISK_NAME_SIZE) == 0 ? szWhole : nullptr;
    const int foundRoot = MemberStateGet(ppPair[PAIR_ROOT], szSearched, pRootState);
    if (foundRoot < 0) {
        NLIBCLog(LOG_ERR, "Fail to check root RAID");
        return -1;
    }
    const int foundSwap = MemberStateGet(ppPair[PAIR_SWAP], szSearched, pSwapState);
    if (foundSwap < 0) {
        NLIBCLog(LOG_ERR, "Fail to check swap RAID");
        return -1;
    }
    return foundRoot == 1 || foundSwap == 1 ? 1 : 0;
}

int RAIDSystemDiskStatusGet(RAID_INFO *const *ppPair, const char *szDisk, u32 *pStatus)
{
    if (!IsPairValid(ppPair, szDisk)) {
        return -1;
    }
    u32 rootState = DISK_STATE_NONE;
    u32 swapState = DISK_STATE_NONE;
    const int found = RAIDSystemDiskStatusDetailGet(ppPair, szDisk, &rootState, &swapState);
    if (found < 0) {
        NLIBCLog(LOG_ERR, "Fail to get system disk detail status");
        return -1;
    }
    const u32 status = found == 0 ? DISK_STATE_NONE : SystemStateOf(rootState, swapState);
    if (pStatus != nullptr) {
        *pStatus = status;
    }
    return found;
}
