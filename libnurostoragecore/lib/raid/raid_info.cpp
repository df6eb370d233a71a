// SPDX-License-Identifier: MIT
#include "nurostoragecore/raid_info.h"

#include "attribute/attribute.h"
#include "nurocore/error.h"
#include "nurocore/handle.h"
#include "nurocore/log.h"
#include "nurocore/types.h"
#include "nurostoragecore/raid_disk.h"
#include "raid/mdp_major.h"
#include "raid/raid_owner.h"

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <linux/fs.h>
#include <linux/major.h>
#include <string_view>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>

namespace
{

struct SYNC_STATUS {
    u64 activity;
    u64 done;
    u64 total;
};

// Requests of the appliance's own md driver.
constexpr unsigned long MD_GET_SYNC_STATUS = _IOR(MD_MAJOR, 0x60, SYNC_STATUS);
constexpr unsigned long MD_GET_ARRAY_STATUS = _IOR(MD_MAJOR, 0x61, i32);

// The direction bits of a request number depend on the platform. The number of BLKGETSIZE64
// contains the size of a size_t, though the request always returns 64 bits.
constexpr u32 DIRECTION_READ = static_cast<u32>(_IOC_READ) << static_cast<u32>(_IOC_DIRSHIFT);
static_assert(DIRECTION_READ == 0x80000000 || DIRECTION_READ == 0x40000000);
static_assert(sizeof(SYNC_STATUS) == 24 && sizeof(mdu_array_info_t) == 72);
static_assert(GET_ARRAY_INFO == (DIRECTION_READ | 0x480911) &&
              MD_GET_ARRAY_STATUS == (DIRECTION_READ | 0x040961) &&
              MD_GET_SYNC_STATUS == (DIRECTION_READ | 0x180960));
static_assert(BLKGETSIZE64 == (DIRECTION_READ | (sizeof(size_t) == 8 ? 0x081272 : 0x041272)));

constexpr u64 BYTES_PER_KIB = 1024;
constexpr u64 SECTORS_PER_KIB = 2;
constexpr int COMPONENT_SIZE_TEXT_SIZE = 50;
constexpr int PATH_SIZE = 128;

struct LEVEL_ROW {
    i32 mdLevel;
    u32 level;
};

constexpr LEVEL_ROW LEVELS[] = {
    {0, RAID_LEVEL_0}, {1, RAID_LEVEL_1},   {5, RAID_LEVEL_5},
    {6, RAID_LEVEL_6}, {10, RAID_LEVEL_10}, {-1, RAID_LEVEL_LINEAR},
};

u32 LevelOf(i32 mdLevel)
{
    for (const LEVEL_ROW &row : LEVELS) {
        if (row.mdLevel == mdLevel) {
            return row.level;
        }
    }
    NLIBCLog(LOG_DEBUG, "Not supported RAID level: %d", mdLevel);
    return 0;
}

i32 MdpMajorGet()
{
    static i32 mdpMajor = MAJOR_UNKNOWN;
    if (mdpMajor == MAJOR_UNKNOWN) {
        mdpMajor = MdpMajorRead();
    }
    return mdpMajor;
}

// KiB used on each member. The driver's own field has 32 bits; larger sizes are read from sysfs.
u64 DeviceSizeKiB(int fd, const mdu_array_info_t &array, u64 arraySize)
{
    constexpr u64 FIELD_LIMIT = 0xFFFFFFFF;
    const bool fField = array.major_version == 0 || (arraySize < FIELD_LIMIT && array.size != 0);
    return fField ? static_cast<u64>(static_cast<i64>(array.size))
                  : RAIDComponentSizeGet(fd) / SECTORS_PER_KIB;
}

bool HasDeviceSize(u32 level)
{
    return (level & (RAID_LEVEL_0 | RAID_LEVEL_LINEAR)) == 0;
}

void GeometryStore(const mdu_array_info_t &array, RAID_INFO *pInfo)
{
    pInfo->majorVersion = array.major_version;
    pInfo->minorVersion = array.minor_version;
    pInfo->level = LevelOf(array.level);
    pInfo->nRaidDisks = array.raid_disks;
    pInfo->nActiveDisks = array.active_disks;
    pInfo->nSpareDisks = array.spare_disks;
}

// The members are looked up by szMd, the path that was opened: the record's copy may be truncated.
int InfoFill(const char *szMd, int fd, RAID_INFO *pInfo)
{
    mdu_array_info_t array = {};
    if (RAIDIoctlInfo(fd, &array) != 0) {
        if (NLIBCErrGet() == ERR_DEVICE_ABSENT) {
            return 0;
        }
        NLIBCLog(LOG_DEBUG, "Failed to ioctl for raid status, errno=0X%X", NLIBCErrGet());
        return -1;
    }
    GeometryStore(array, pInfo);
    if (RAIDIoctlSize(fd, &pInfo->arraySize) != 0) {
        NLIBCLog(LOG_DEBUG, "Failed to ioctl for raid size, errno=0X%X", NLIBCErrGet());
        return -1;
    }
    const u64 nKiB = DeviceSizeKiB(fd, array, pInfo->arraySize);
    pInfo->deviceSize = HasDeviceSize(pInfo->level) ? nKiB * BYTES_PER_KIB : 0;
    // Kept: a failed rebuild query is logged with the message of the member list, a failed health
    // query with that of the size.
    if (RAIDDiskListGet(szMd, &pInfo->pDisks) != 0 ||
        RAIDRebuildStatusGet(fd, &pInfo->rebuild) != 0) {
        NLIBCLog(LOG_DEBUG, "Failed to get disk list for /dev/md%d, errno=0X%X", pInfo->nMd,
                 NLIBCErrGet());
        return -1;
    }
    if (RAIDIoctlStatus(fd, &pInfo->status) != 0) {
        NLIBCLog(LOG_DEBUG, "Failed to ioctl for raid size, errno=0X%X", NLIBCErrGet());
        return -1;
    }
    return 1;
}

} // namespace

int RAIDInfoGet(const char *szMd, RAID_INFO **ppInfo)
{
    if (szMd == nullptr || ppInfo == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    int nMd = 0;
    if (sscanf(szMd, "/dev/md%d", &nMd) != 1) {
        NLIBCLog(LOG_DEBUG, "invalide path %s, errno=%m", szMd);
        NLIBCErrSetHere(ERR_BAD_FORMAT);
        return -1;
    }
    RAID_INFO_OWNER pInfo(static_cast<RAID_INFO *>(calloc(1, sizeof(RAID_INFO))));
    if (pInfo == nullptr) {
        NLIBCLog(LOG_DEBUG, "Failed to calloc, errno=%m");
        NLIBCErrSetHere(ERR_OUT_OF_MEMORY);
        return -1;
    }
    pInfo->nMd = nMd;
    (void)snprintf(pInfo->szPath, sizeof(pInfo->szPath), "%s", szMd);
    const FD_OWNER fd(open(szMd, O_RDONLY | O_CLOEXEC));
    if (!fd) {
        NLIBCLog(LOG_DEBUG, "Failed to open %s, errno=%m", szMd);
        NLIBCErrSetHere(ERR_OPEN_FAILED);
        return -1;
    }
    const int result = InfoFill(szMd, fd.get(), pInfo.get());
    if (result == 1) {
        *ppInfo = pInfo.release();
    }
    return result;
}

void RAIDInfoFree(RAID_INFO *pInfo)
{
    if (pInfo == nullptr) {
        return;
    }
    RAIDDiskListFree(pInfo->pDisks);
    free(pInfo);
}

int RAIDIoctlInfo(int fd, mdu_array_info_t *pInfo)
{
    if (pInfo == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    if (ioctl(fd, GET_ARRAY_INFO, pInfo) == 0) {
        return 0;
    }
    if (errno == EINTR) {
        NLIBCErrSetHere(ERR_INTERRUPTED);
        return -1;
    }
    if (errno == ENODEV) {
        // Kept: overwritten below, so all callers see an inactive array as a failure, not as
        // absent.
        NLIBCErrSetHere(ERR_DEVICE_ABSENT);
    }
    NLIBCLog(LOG_DEBUG, "Failed to ioctl for raid status, errno=%m");
    NLIBCErrSetHere(ERR_SYSCALL_FAILED);
    return -1;
}

int RAIDIoctlSize(int fd, u64 *pcbArray)
{
    if (pcbArray == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    *pcbArray = 0;
    if (ioctl(fd, BLKGETSIZE64, pcbArray) == 0) {
        return 0;
    }
    if (errno == ENODEV) {
        NLIBCErrSetHere(ERR_DEVICE_ABSENT);
        return -1;
    }
    NLIBCLog(LOG_DEBUG, "Failed to ioctl for raid status, errno=%m");
    NLIBCErrSetHere(ERR_SYSCALL_FAILED);
    return -1;
}

int RAIDIoctlStatus(int fd, u32 *pStatus)
{
    if (pStatus == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    i32 health = 0;
    if (ioctl(fd, MD_GET_ARRAY_STATUS, &health) != 0) {
        if (errno == ENODEV || errno == EINTR) {
            NLIBCErrSetHere(errno == ENODEV ? ERR_DEVICE_ABSENT : ERR_INTERRUPTED);
            return -1;
        }
        NLIBCLog(LOG_DEBUG, "Failed to ioctl for raid status, errno=%m");
        NLIBCErrSetHere(ERR_SYSCALL_FAILED);
        return -1;
    }
    // Indexed by the driver's answer.
    constexpr u32 STATUSES[] = {RAID_STATUS_NORMAL, RAID_STATUS_DEGRADE, RAID_STATUS_CRASHED};
    if (health < 0 || static_cast<size_t>(health) >= std::size(STATUSES)) {
        NLIBCLog(LOG_DEBUG, "unknown raid status, status=%d", health);
        NLIBCErrSetHere(ERR_SYSCALL_FAILED);
        return -1;
    }
    *pStatus = STATUSES[health];
    return 0;
}

int RAIDRebuildStatusGet(int fd, RAID_REBUILD_STATUS *pRebuild)
{
    if (fd < 0 || pRebuild == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    SYNC_STATUS sync = {};
    if (ioctl(fd, MD_GET_SYNC_STATUS, &sync) != 0) {
        if (errno == ENODEV) {
            NLIBCErrSetHere(ERR_DEVICE_ABSENT);
            return -1;
        }
        NLIBCLog(LOG_DEBUG, "Failed to ioctl for sync status, errno=%m");
        NLIBCErrSetHere(ERR_SYSCALL_FAILED);
        return -1;
    }
    *pRebuild = {};
    if (sync.activity != 0) {
        *pRebuild = {.state = sync.done == 0 ? REBUILD_WAITING : REBUILD_PROGRESSING,
                     .done = sync.done,
                     .total = sync.total};
    }
    return 0;
}

u64 RAIDComponentSizeGet(int fd)
{
    constexpr unsigned int MDP_MINOR_SHIFT = 6; // 64 minors per array, partitions included
    struct stat status = {};
    if (fstat(fd, &status) != 0) {
        return 0;
    }
    const unsigned int deviceMinor = minor(status.st_rdev);
    char szFile[PATH_SIZE];
    if (static_cast<i32>(major(status.st_rdev)) != MdpMajorGet()) {
        (void)snprintf(szFile, sizeof(szFile), "/sys/block/md%u/md/component_size", deviceMinor);
    } else {
        (void)snprintf(szFile, sizeof(szFile), "/sys/block/md_d%u/md/component_size",
                       deviceMinor >> MDP_MINOR_SHIFT);
    }
    // The number is that of the whole text, not of its first line.
    char szSize[COMPONENT_SIZE_TEXT_SIZE + 1];
    const ssize_t cbRead = AttributeRead(szFile, szSize, sizeof(szSize));
    if (cbRead <= ATTRIBUTE_NOT_READ || cbRead == COMPONENT_SIZE_TEXT_SIZE) {
        return 0;
    }
    return strtoull(szSize, nullptr, 10) * SECTORS_PER_KIB;
}
