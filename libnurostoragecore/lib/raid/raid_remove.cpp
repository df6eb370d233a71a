// SPDX-License-Identifier: MIT
#include "nurostoragecore/raid_remove.h"

#include "hwcontrol/disk_name.h"
#include "nurocore/error.h"
#include "nurocore/hash.h"
#include "nurocore/log.h"
#include "nurocore/szlist.h"
#include "nurostoragecore/partition_enum.h"
#include "nurostoragecore/program_path.h"
#include "nurostoragecore/raid_info.h"
#include "nurostoragecore/raid_superblock.h"
#include "nurostoragecore/space.h"
#include "raid/raid_owner.h"

#include <cstdio>
#include <cstring>
#include <unistd.h>

namespace
{

constexpr int LIST_SIZE = 512; // bytes
constexpr int HASH_POOL_SIZE = 512;
constexpr int DISK_NAME_SIZE = 128;
constexpr int STOP_ATTEMPTS = 3;
constexpr unsigned int STOP_PAUSE_SECONDS = 1;
constexpr int LAST_SYSTEM_PARTITION = 2; // 1 is the system, 2 is swap

bool StopRetried(const char *szMd)
{
    for (int i = 0; i < STOP_ATTEMPTS; i++) {
        if (RAIDStop(szMd) == 0) {
            return true;
        }
        NLIBCLog(LOG_ERR, "Fail to stop [%s], try again", szMd);
        // After the last attempt too: scripts that look at the array next rely on the pause.
        (void)sleep(STOP_PAUSE_SECONDS);
    }
    NLIBCLog(LOG_ERR, "Reach RAID stop retry limit");
    return false;
}

// Numbers 1 and 2 belong to the system arrays and are never examined, whatever they contain.
bool IsDataPartition(const char *szPath)
{
    char szDisk[DISK_NAME_SIZE];
    return strstr(szPath, "sd") != nullptr &&
           DiskPartitionNumGet(szPath, szDisk, DISK_NAME_SIZE) > LAST_SYSTEM_PARTITION;
}

// An empty UUID is compared like any other: a partition that reports none belongs to an array that
// has none.
int WipeMatching(const NLIBSZLIST *pKeys, const NLIBHASH *pUuidHash, const char *szUuid)
{
    for (int i = 0; i < pKeys->nItem; i++) {
        const char *const szPartition = NLIBCSzListGet(pKeys, i);
        const char *const szFound = NLIBCHashGet(pUuidHash, szPartition);
        if (szFound == nullptr || strcmp(szFound, szUuid) != 0) {
            continue;
        }
        if (RAIDZeroSuperblock(szPartition) != 0) {
            NLIBCLog(LOG_ERR, "Failed to clean suerblock of '%s'", szPartition);
            return -1;
        }
        NLIBCLog(LOG_ERR, "[Info] Clean RAID superblock on '%s'", szPartition);
    }
    return 0;
}

int CleanByMap(const char *szUuid, const NLIBHASH *pUuidHash, PNLIBSZLIST *ppKeys)
{
    if (NLIBCHashKeyListGet(pUuidHash, ppKeys) < 0) {
        NLIBCLog(LOG_ERR, "Fail to get hash key list");
        return -1;
    }
    return WipeMatching(*ppKeys, pUuidHash, szUuid);
}

int CleanByOwnMap(const char *szUuid, PNLIBSZLIST *ppKeys)
{
    PNLIBHASH pUuidHash = NLIBCHashAlloc(HASH_POOL_SIZE);
    const HASH_OWNER owner(&pUuidHash);
    if (pUuidHash == nullptr) {
        NLIBCLog(LOG_ERR, "Fail to alloc RAID UUID hash");
        return -1;
    }
    if (RAIDUUIDHashForRemoveGet(&pUuidHash) != 0) {
        NLIBCLog(LOG_ERR, "Fail to get RAID UUID hash");
        return -1;
    }
    return CleanByMap(szUuid, pUuidHash, ppKeys);
}

} // namespace

int RAIDStop(const char *szMd)
{
    if (szMd == nullptr) {
        NLIBCLog(LOG_ERR, "Bad parameters");
        return -1;
    }
    if (SpaceExecl(MDADM_PATH, "-S", szMd, nullptr) != 0) {
        NLIBCLog(LOG_ERR, "Failed to mdadm stop '%s'", szMd);
        return -1;
    }
    return 0;
}

int RAIDZeroSuperblock(const char *szDevice)
{
    if (szDevice == nullptr) {
        NLIBCLog(LOG_ERR, "Bad parameters");
        return -1;
    }
    if (SpaceExecl(MDADM_PATH, "--zero-superblock", szDevice, nullptr) != 0) {
        NLIBCLog(LOG_ERR, "Failed to zero RAID superblock '%s'", szDevice);
        return -1;
    }
    return 0;
}

int RAIDUUIDHashForRemoveGet(PNLIBHASH *ppUuidHash)
{
    if (ppUuidHash == nullptr) {
        NLIBCLog(LOG_ERR, "Bad parameters");
        return -1;
    }
    PNLIBSZLIST pPartitions = NLIBCSzListAlloc(LIST_SIZE);
    const LIST_OWNER owner(&pPartitions);
    if (pPartitions == nullptr) {
        NLIBCLog(LOG_ERR, "Fail to alloc RAID UUID list");
        return -1;
    }
    if (PartitionPathEnum(nullptr, &pPartitions) < 0) {
        NLIBCLog(LOG_ERR, "Fail to enum partition path");
        return -1;
    }
    for (int i = 0; i < pPartitions->nItem; i++) {
        const char *const szPartition = NLIBCSzListGet(pPartitions, i);
        RAID_SUPERBLOCK superblock = {};
        if (IsDataPartition(szPartition) && RAIDSuperblockGet(szPartition, &superblock) == 1) {
            // A partition that does not fit into the map is not wiped; the others still are.
            (void)NLIBCHashSet(ppUuidHash, szPartition, superblock.szUuid);
        }
    }
    return 0;
}

int RAIDCleanSuperblock(const RAID_INFO *pInfo, const char *szUuid, PNLIBHASH pUuidHash)
{
    if (pInfo == nullptr || szUuid == nullptr) {
        NLIBCLog(LOG_ERR, "Bad parameters");
        return -1;
    }
    PNLIBSZLIST pKeys = NLIBCSzListAlloc(LIST_SIZE);
    const LIST_OWNER owner(&pKeys);
    if (pKeys == nullptr) {
        NLIBCLog(LOG_ERR, "Fail to alloc RAID UUID list");
        return -1;
    }
    return pUuidHash == nullptr ? CleanByOwnMap(szUuid, &pKeys)
                                : CleanByMap(szUuid, pUuidHash, &pKeys);
}

int RAIDUUIDGet(const char *szMd, char *szBuf, int cbBuf)
{
    if (szMd == nullptr || szBuf == nullptr || cbBuf <= 0) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    RAID_INFO *pFound = nullptr;
    const int found = RAIDInfoGet(szMd, &pFound);
    const RAID_INFO_OWNER pInfo(pFound);
    if (found < 0) {
        NLIBCLog(LOG_ERR, "Failed to get RAID info [%s], ret = %d", szMd, found);
        return -1;
    }
    if (found == 0) {
        return 0;
    }
    if (pInfo->pDisks == nullptr) {
        NLIBCErrSetHere(ERR_NO_MEMBER_DISK);
        return -1;
    }
    RAID_SUPERBLOCK superblock = {};
    const int examined = RAIDSuperblockGet(pInfo->pDisks->szPath, &superblock);
    if (examined != 1) {
        NLIBCLog(LOG_ERR, "Disk [%s] in RAID [%s] has no RAID superblock, ret=%d",
                 pInfo->pDisks->szPath, szMd, examined);
        return -1;
    }
    (void)snprintf(szBuf, static_cast<size_t>(cbBuf), "%s", superblock.szUuid);
    return 1;
}

int RAIDRemove(const RAID_INFO *pInfo, PNLIBHASH pUuidHash)
{
    if (pInfo == nullptr) {
        NLIBCLog(LOG_ERR, "Bad parameters");
        return -1;
    }
    // Read before the stop, because only a running array lists its members. The driver does not
    // report a UUID, so a queried record has none and a member's superblock is read.
    char szUuid[RAID_UUID_SIZE];
    (void)snprintf(szUuid, sizeof(szUuid), "%s", pInfo->szUuid);
    const bool fUuid = szUuid[0] != '\0' || RAIDUUIDGet(pInfo->szPath, szUuid, RAID_UUID_SIZE) == 1;
    if (!StopRetried(pInfo->szPath)) {
        return -1;
    }
    if (fUuid) {
        NLIBCLog(LOG_ERR, "[Info] clean RAID superblock of %s", pInfo->szPath);
        (void)RAIDCleanSuperblock(pInfo, szUuid, pUuidHash);
    }
    return 0;
}

int RAIDRemoveByInfo(const RAID_INFO *pInfo)
{
    return RAIDRemove(pInfo, nullptr);
}
