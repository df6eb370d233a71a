// SPDX-License-Identifier: MIT
#include "nurostoragecore/raid_membership.h"

#include "hwcontrol/disk_name.h"
#include "nurocore/error.h"
#include "nurocore/handle.h"
#include "nurocore/log.h"
#include "nurostoragecore/partition_layout.h"
#include "nurostoragecore/raid_info.h"
#include "nurostoragecore/raid_superblock.h"

#include <cstdio>
#include <fcntl.h>

namespace
{

constexpr int PARTITION_PATH_SIZE = 128;
constexpr int DATA_PARTITIONS[] = {3, 5};

// The superblock of a whole disk counts only with an array number from here up; lower numbers are
// left over from earlier uses of the disk.
constexpr int WHOLE_DISK_MD_FIRST = 101;

bool IsMemberBySuperblock(const char *szDevice, int *pMd)
{
    return RAIDDiskSuperblockMdGet(szDevice, pMd) == 1;
}

bool IsMemberByPartition(const char *szDisk, int partNum, int *pMd)
{
    char szPartition[PARTITION_PATH_SIZE];
    return DiskDevicePartitionPathGet(szDisk, partNum, szPartition, sizeof(szPartition)) == 0 &&
           IsMemberBySuperblock(szPartition, pMd);
}

bool IsMember(const char *szDisk, int *pMd)
{
    for (const int partNum : DATA_PARTITIONS) {
        if (IsMemberByPartition(szDisk, partNum, pMd)) {
            return true;
        }
    }
    if (PartitionCheckLayout(szDisk, IsSupportRaid(), nullptr) == 1) {
        return false;
    }
    return IsMemberBySuperblock(szDisk, pMd) && *pMd >= WHOLE_DISK_MD_FIRST;
}

} // namespace

int RAIDDiskSuperblockMdGet(const char *szDevice, int *pMd)
{
    if (szDevice == nullptr || pMd == nullptr) {
        NLIBCLog(LOG_ERR, "Bad parameters");
        return -1;
    }
    RAID_SUPERBLOCK superblock = {};
    if (RAIDSuperblockGet(szDevice, &superblock) != 1) {
        return 0;
    }
    int nMd = 0;
    if (sscanf(superblock.szMdPath, "/dev/md%d", &nMd) != 1) {
        NLIBCLog(LOG_ERR, "Failed to sscanf [%s], errno=%m", superblock.szMdPath);
        return -1;
    }
    *pMd = nMd;
    return 1;
}

int RAIDDiskIsUsedByRAID(const char *szDisk, int *pMd)
{
    if (szDisk == nullptr) {
        NLIBCLog(LOG_ERR, "Bad parameters");
        return -1;
    }
    int nMd = 0;
    if (!IsMember(szDisk, &nMd)) {
        return 0;
    }
    if (pMd != nullptr) {
        *pMd = nMd;
    }
    return 1;
}

int RAIDIsDetected(const char *szMd)
{
    if (szMd == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    const FD_OWNER fd(open(szMd, O_RDONLY | O_CLOEXEC));
    if (!fd) {
        NLIBCLog(LOG_DEBUG, "Failed to open %s, errno=%m", szMd);
        NLIBCErrSetHere(ERR_OPEN_FAILED);
        return -1;
    }
    mdu_array_info_t array = {};
    if (RAIDIoctlInfo(fd.get(), &array) == 0) {
        return 1;
    }
    if (NLIBCErrGet() == ERR_DEVICE_ABSENT) {
        return 0;
    }
    NLIBCLog(LOG_DEBUG, "Failed to ioctl %s, errno=0X%X", szMd, NLIBCErrGet());
    return -1;
}
