// SPDX-License-Identifier: MIT
#include "nurostoragecore/raid_disk.h"

#include "attribute/attribute.h"
#include "hwcontrol/disk_name.h"
#include "nurocore/error.h"
#include "nurocore/handle.h"
#include "nurocore/log.h"
#include "nurocore/text.h"
#include "nurocore/types.h"
#include "raid/raid_owner.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <glob.h>

namespace
{

constexpr char MEMBER_PREFIX[] = "dev-";
constexpr int PATH_SIZE = 512;
constexpr int SLOT_SIZE = 64;
constexpr int ACTION_SIZE = 128;
constexpr int DISK_NAME_SIZE = 64;

// Indexed by SYNC_ACTION_*.
constexpr const char *SYNC_ACTIONS[] = {"idle",  "frozen", "reshape", "resync",
                                        "check", "repair", "recover"};

bool Holds(const char *szText, const char *szWord)
{
    return strstr(szText, szWord) != nullptr;
}

int AttrRead(const char *szDir, const char *szAttr, char *szBuf)
{
    char szFile[PATH_SIZE];
    (void)snprintf(szFile, sizeof(szFile), "%s/%s", szDir, szAttr);
    if (RAIDDiskAttrRead(szFile, szBuf) != 0) {
        NLIBCLog(LOG_DEBUG, "Failed to get status from %s, errno=0X%X", szFile, NLIBCErrGet());
        return -1;
    }
    return 0;
}

int PathGet(const char *szDir, char *szPath)
{
    const char *const pchPrefix = strstr(szDir, MEMBER_PREFIX);
    if (pchPrefix == nullptr) {
        NLIBCLog(LOG_DEBUG, "Failed to strstr %s, errno=%m", szDir);
        NLIBCErrSetHere(ERR_TEXT_NOT_FOUND);
        return -1;
    }
    DevicePathBuild(pchPrefix + strlen(MEMBER_PREFIX), szPath, RAID_PATH_SIZE);
    return 0;
}

int SlotGet(const char *szDir, i32 *pSlot)
{
    char szFile[PATH_SIZE];
    (void)snprintf(szFile, sizeof(szFile), "%s/slot", szDir);
    char szSlot[SLOT_SIZE];
    const ssize_t cbRead = AttributeLineRead(szFile, szSlot, SLOT_SIZE);
    if (cbRead == ATTRIBUTE_NOT_OPENED) {
        // Kept: no code is set here, callers see the previous one.
        NLIBCLog(LOG_ERR, "failed to fopen %s, errno=%m", szFile);
        return -1;
    }
    if (cbRead == ATTRIBUTE_NOT_READ) {
        NLIBCLog(LOG_DEBUG, "Failed to get disk slot, errno=%m");
        NLIBCErrSetHere(ERR_READ_FAILED);
        return -1;
    }
    szSlot[strcspn(szSlot, "\n")] = '\0';
    *pSlot = strcmp(szSlot, "none") == 0 ? -1 : NLIBCStrToI32(szSlot);
    return 0;
}

int MembersCollect(const glob_t &matches, RAID_DISK **ppDisks)
{
    RAID_DISK *pDisks = nullptr;
    for (size_t i = 0; i < matches.gl_pathc; i++) {
        RAID_DISK *pDisk = nullptr;
        if (RAIDDiskCreate(matches.gl_pathv[i], &pDisk) != 0) {
            NLIBCLog(LOG_DEBUG, "Failed to create disk info from %s ,errno=0X%X",
                     matches.gl_pathv[i], NLIBCErrGet());
            continue;
        }
        RAIDDiskListPush(&pDisks, pDisk);
    }
    *ppDisks = pDisks;
    return 0;
}

// Ignores partition numbers. A name that is too long is logged and matches nothing, not even
// itself.
bool IsSameDisk(const char *szPath, const char *szWanted)
{
    char szDisk[DISK_NAME_SIZE];
    char szWantedDisk[DISK_NAME_SIZE];
    const int removed = DiskPartitionNumRemove(szPath, szDisk, DISK_NAME_SIZE);
    const int removedWanted = DiskPartitionNumRemove(szWanted, szWantedDisk, DISK_NAME_SIZE);
    return removed == 0 && removedWanted == 0 && strcmp(szDisk, szWantedDisk) == 0;
}

} // namespace

int RAIDDiskAttrRead(const char *szFile, char *szBuf)
{
    if (szFile == nullptr || szBuf == nullptr) {
        NLIBCLog(LOG_DEBUG, "parameter error");
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    const ssize_t cbRead = AttributeLineRead(szFile, szBuf, RAID_ATTR_SIZE);
    if (cbRead == ATTRIBUTE_NOT_OPENED) {
        NLIBCLog(LOG_DEBUG, "Failed to fopen %s, errno=%m", szFile);
        NLIBCErrSetHere(ERR_OPEN_FAILED);
        return -1;
    }
    if (cbRead == ATTRIBUTE_NOT_READ) {
        NLIBCLog(LOG_DEBUG, "Failed to NLIBCFgets %s, errno=%m", szFile);
        NLIBCErrSetHere(ERR_READ_FAILED);
        return -1;
    }
    return 0;
}

int RAIDDiskStatusGet(const char *szDir, u32 *pState)
{
    if (szDir == nullptr || pState == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    char szState[RAID_ATTR_SIZE];
    if (AttrRead(szDir, "state", szState) != 0) {
        return -1;
    }
    // A text of several words is decided by the order of these tests.
    if (Holds(szState, "faulty")) {
        *pState = DISK_STATE_FAILED;
    } else if (!Holds(szState, "write_error") && Holds(szState, "error")) {
        *pState = DISK_STATE_CRASHING;
    } else if (!Holds(szState, "in_sync") && Holds(szState, "spare")) {
        char szSlot[RAID_ATTR_SIZE];
        if (AttrRead(szDir, "slot", szSlot) != 0) {
            return -1;
        }
        *pState = Holds(szSlot, "none") ? DISK_STATE_SPARE : DISK_STATE_REBUILDING;
    } else {
        *pState = DISK_STATE_NORMAL;
    }
    return 0;
}

int RAIDDiskCreate(const char *szDir, RAID_DISK **ppDisk)
{
    if (szDir == nullptr || ppDisk == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    RAID_DISK_OWNER pDisk(static_cast<RAID_DISK *>(calloc(1, sizeof(RAID_DISK))));
    if (pDisk == nullptr) {
        NLIBCLog(LOG_DEBUG, "Failed to calloc, errno=%m");
        NLIBCErrSetHere(ERR_OUT_OF_MEMORY);
        return -1;
    }
    if (PathGet(szDir, pDisk->szPath) != 0) {
        NLIBCLog(LOG_DEBUG, "Failed to get path from %s ,errno=0X%X", szDir, NLIBCErrGet());
        return -1;
    }
    if (RAIDDiskStatusGet(szDir, &pDisk->state) != 0) {
        NLIBCLog(LOG_DEBUG, "Failed to get status from %s, errno=0X%X", szDir, NLIBCErrGet());
        return -1;
    }
    if (SlotGet(szDir, &pDisk->slot) != 0) {
        NLIBCLog(LOG_DEBUG, "Failed to get slot of %s, errno=0X%X", szDir, NLIBCErrGet());
        return -1;
    }
    *ppDisk = pDisk.release();
    return 0;
}

int RAIDDiskListGet(const char *szMd, RAID_DISK **ppDisks)
{
    if (szMd == nullptr || ppDisks == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    int nMd = 0;
    if (sscanf(szMd, "/dev/md%d", &nMd) != 1) {
        NLIBCLog(LOG_DEBUG, "invalide path %s, errno=%m", szMd);
        NLIBCErrSetHere(ERR_BAD_FORMAT);
        return -1;
    }
    char szPattern[PATH_SIZE];
    (void)snprintf(szPattern, sizeof(szPattern), "/sys/block/md%d/md/%s*", nMd, MEMBER_PREFIX);
    glob_t matches = {};
    const GLOB_OWNER owner(&matches);
    const int globbed = glob(szPattern, 0, nullptr, &matches);
    if (globbed == GLOB_NOMATCH) {
        return 0;
    }
    if (globbed != 0) {
        NLIBCLog(LOG_DEBUG, "failed to glob '%s', errno=%m", szPattern);
        NLIBCErrSetHere(ERR_SYSCALL_FAILED);
        return -1;
    }
    return MembersCollect(matches, ppDisks);
}

void RAIDDiskListPush(RAID_DISK **ppDisks, RAID_DISK *pDisk)
{
    if (ppDisks == nullptr || pDisk == nullptr) {
        // Kept: this code, not the one for bad parameters.
        NLIBCErrSetHere(ERR_OUT_OF_MEMORY);
        return;
    }
    pDisk->pNext = *ppDisks;
    *ppDisks = pDisk;
}

void RAIDDiskListFree(RAID_DISK *pDisks)
{
    while (pDisks != nullptr) {
        RAID_DISK *const pNext = pDisks->pNext;
        free(pDisks);
        pDisks = pNext;
    }
}

int RAIDDiskListSearch(RAID_DISK *pDisks, const char *szDisk, RAID_DISK **ppDisk)
{
    if (szDisk == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    for (RAID_DISK *pDisk = pDisks; pDisk != nullptr; pDisk = pDisk->pNext) {
        if (!IsSameDisk(pDisk->szPath, szDisk)) {
            continue;
        }
        if (ppDisk != nullptr) {
            *ppDisk = pDisk;
        }
        return 1;
    }
    return 0;
}

int RAIDSyncActionGet(int nMd, int *pAction)
{
    if (pAction == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    if (nMd < 0) {
        return -1;
    }
    char szFile[PATH_SIZE];
    (void)snprintf(szFile, sizeof(szFile), "/sys/block/md%d/md/sync_action", nMd);
    char szAction[ACTION_SIZE];
    const ssize_t cbRead = AttributeLineRead(szFile, szAction, ACTION_SIZE);
    if (cbRead == ATTRIBUTE_NOT_OPENED) {
        NLIBCLog(LOG_ERR, "open \"%s\" failed", szFile);
        return -1;
    }
    if (cbRead == ATTRIBUTE_NOT_READ) {
        NLIBCLog(LOG_ERR, "failed to get line from \"%s\"", szFile);
        return -1;
    }
    const size_t cchLine = strlen(szAction);
    const size_t cchWord = cchLine == 0 ? 0 : cchLine - 1;
    // Kept: a prefix of a word counts as that word, so an empty line is idle.
    for (int i = 0; i <= SYNC_ACTION_RECOVER; i++) {
        if (strncmp(szAction, SYNC_ACTIONS[i], cchWord) == 0) {
            *pAction = i;
            return 0;
        }
    }
    return -1;
}
