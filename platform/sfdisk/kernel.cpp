// SPDX-License-Identifier: MIT
#include "kernel.h"
#include "disk.h"
#include "partition.h"
#include "table.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <dirent.h>
#include <linux/blkpg.h>
#include <memory>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>

namespace
{

// A partition that has just been released, or is only being probed, will be free soon.
constexpr int DROP_TRIES = 50;
// The node exists at once when the kernel makes it, and soon when a program does.
constexpr int NODE_TRIES = 250;
constexpr timespec PAUSE = {0, 20'000'000};

constexpr int NAME_SIZE = 64;
constexpr int PATH_SIZE = 512;

struct DIRECTORY_DELETER {
    void operator()(DIR *pDirectory) const
    {
        closedir(pDirectory);
    }
};

struct STREAM_DELETER {
    void operator()(FILE *pStream) const
    {
        fclose(pStream);
    }
};

using DIRECTORY_OWNER = std::unique_ptr<DIR, DIRECTORY_DELETER>;
using STREAM_OWNER = std::unique_ptr<FILE, STREAM_DELETER>;

struct KERNEL_PARTITION {
    PARTITION partition;
    dev_t device;
    char szName[NAME_SIZE];
};

void DiskFolderGet(const DISK *pDisk, char *szFolder)
{
    snprintf(szFolder, PATH_SIZE, "/sys/dev/block/%u:%u", major(pDisk->device),
             minor(pDisk->device));
}

bool AttributeRead(const char *szFolder, const char *szPartition, const char *szName, char *szText)
{
    char szPath[PATH_SIZE];
    const int cb = snprintf(szPath, sizeof(szPath), "%s/%s/%s", szFolder, szPartition, szName);
    if (cb >= PATH_SIZE) {
        return false;
    }
    const STREAM_OWNER pStream{fopen(szPath, "re")};
    return pStream && fgets(szText, NAME_SIZE, pStream.get());
}

bool AttributeNumberRead(const char *szFolder, const char *szPartition, const char *szName,
                         u64 *pValue)
{
    char szText[NAME_SIZE];
    if (!AttributeRead(szFolder, szPartition, szName, szText)) {
        return false;
    }
    *pValue = strtoull(szText, nullptr, 10);
    return true;
}

// False for directories that are not partitions, and for one that disappears while it is read.
bool KernelPartitionRead(const char *szFolder, const char *szName, KERNEL_PARTITION *pItem)
{
    char szDevice[NAME_SIZE];
    u64 number = 0;
    if (szName[0] == '.' || !AttributeNumberRead(szFolder, szName, "partition", &number) ||
        !AttributeNumberRead(szFolder, szName, "start", &pItem->partition.start) ||
        !AttributeNumberRead(szFolder, szName, "size", &pItem->partition.sectors) ||
        !AttributeRead(szFolder, szName, "dev", szDevice)) {
        return false;
    }
    char *pMinor = szDevice;
    const auto majorNumber = static_cast<unsigned>(strtoul(szDevice, &pMinor, 10));
    const auto minorNumber = static_cast<unsigned>(strtoul(pMinor + 1, nullptr, 10));
    pItem->partition.number = static_cast<int>(number);
    pItem->device = makedev(majorNumber, minorNumber);
    snprintf(pItem->szName, sizeof(pItem->szName), "%.63s", szName);
    return true;
}

int KernelListRead(const DISK *pDisk, PARTITION_LIST *pList)
{
    char szFolder[PATH_SIZE];
    DiskFolderGet(pDisk, szFolder);
    const DIRECTORY_OWNER pDirectory{opendir(szFolder)};
    if (!pDirectory) {
        return Complain("cannot read %s: %s", szFolder, strerror(errno));
    }
    pList->nItem = 0;
    while (const dirent *pEntry = readdir(pDirectory.get())) {
        KERNEL_PARTITION item = {};
        if (KernelPartitionRead(szFolder, pEntry->d_name, &item) &&
            PartitionPush(pList, item.partition) != 0) {
            return 1;
        }
    }
    return 0;
}

// The size that the kernel gives an entry's partition: cut at the end of the disk, and for an
// extended partition only the sectors where its chain begins, so that nobody formats it. 0 when the
// kernel makes no partition of the entry.
u64 KernelSizeGet(const TABLE *pTable, const PARTITION &partition)
{
    if (partition.start >= pTable->sectors) {
        return 0;
    }
    const u64 sectors = std::min(partition.sectors, pTable->sectors - partition.start);
    return partition.fContainer ? std::min(sectors, std::max<u64>(pTable->unit, 2)) : sectors;
}

// The size of an extended partition is not compared: it depends on the kernel's version.
bool IsSame(const TABLE *pTable, const PARTITION &known, const PARTITION *pPlanned)
{
    return pPlanned && known.start == pPlanned->start &&
           (pPlanned->fContainer || known.sectors == KernelSizeGet(pTable, *pPlanned));
}

// Returns 0, or the error number.
int KernelRequest(const DISK *pDisk, int operation, int number, u64 start, u64 sectors)
{
    constexpr auto BYTES = static_cast<long long>(SECTOR_SIZE);
    blkpg_partition partition = {};
    blkpg_ioctl_arg request = {};

    partition.pno = number;
    partition.start = static_cast<long long>(start) * BYTES;
    partition.length = static_cast<long long>(sectors) * BYTES;
    request.op = operation;
    request.datalen = sizeof(partition);
    request.data = &partition;
    return ioctl(pDisk->file.get().fd, BLKPG, &request) == 0 ? 0 : errno;
}

int PartitionForget(const DISK *pDisk, int number)
{
    int error = EBUSY;
    for (int i = 0; i < DROP_TRIES && error == EBUSY; i++) {
        if (i > 0) {
            nanosleep(&PAUSE, nullptr);
        }
        error = KernelRequest(pDisk, BLKPG_DEL_PARTITION, number, 0, 0);
    }
    return error == ENXIO ? 0 : error;
}

void KernelRestore(const DISK *pDisk, const PARTITION_LIST *pForgotten)
{
    for (int i = 0; i < pForgotten->nItem; i++) {
        const PARTITION &item = pForgotten->items[i];
        if (KernelRequest(pDisk, BLKPG_ADD_PARTITION, item.number, item.start, item.sectors) != 0) {
            (void)Complain("the kernel lost partition %d of %s", item.number, pDisk->szPath);
        }
    }
}

bool NodeExists(const KERNEL_PARTITION &item)
{
    char szNode[PATH_SIZE];
    struct stat status = {};
    const int cb = snprintf(szNode, sizeof(szNode), "/dev/%s", item.szName);
    // sysfs writes ! for the / of a name such as cciss/c0d0p1.
    std::replace(szNode, szNode + std::min(cb, PATH_SIZE - 1), '!', '/');
    return stat(szNode, &status) == 0 && S_ISBLK(status.st_mode) && status.st_rdev == item.device;
}

bool PartitionHasNode(const DISK *pDisk, int number)
{
    char szFolder[PATH_SIZE];
    DiskFolderGet(pDisk, szFolder);
    const DIRECTORY_OWNER pDirectory{opendir(szFolder)};
    while (const dirent *pEntry = pDirectory ? readdir(pDirectory.get()) : nullptr) {
        KERNEL_PARTITION item = {};
        if (KernelPartitionRead(szFolder, pEntry->d_name, &item) &&
            item.partition.number == number) {
            return NodeExists(item);
        }
    }
    return false;
}

int NodeWait(const DISK *pDisk, int number)
{
    for (int i = 0; i < NODE_TRIES; i++) {
        if (PartitionHasNode(pDisk, number)) {
            return 0;
        }
        nanosleep(&PAUSE, nullptr);
    }
    return Complain("the node of partition %d of %s does not appear", number, pDisk->szPath);
}

int PartitionAnnounce(const DISK *pDisk, const PARTITION &partition, u64 sectors)
{
    const int error =
        KernelRequest(pDisk, BLKPG_ADD_PARTITION, partition.number, partition.start, sectors);
    if (error != 0) {
        return Complain("the kernel does not take partition %d of %s: %s", partition.number,
                        pDisk->szPath, strerror(error));
    }
    return NodeWait(pDisk, partition.number);
}

} // namespace

int KernelDrop(const DISK *pDisk, const TABLE *pTable, const PARTITION_LIST *pPlan)
{
    PARTITION_LIST known = {};
    PARTITION_LIST forgotten = {};

    if (!pDisk->fBlock) {
        return 0;
    }
    if (KernelListRead(pDisk, &known) != 0) {
        return 1;
    }
    for (int i = 0; i < known.nItem; i++) {
        const PARTITION &item = known.items[i];
        if (IsSame(pTable, item, PartitionFind(pPlan, item.number))) {
            continue;
        }
        const int error = PartitionForget(pDisk, item.number);
        if (error != 0) {
            KernelRestore(pDisk, &forgotten);
            return Complain(error == EBUSY ? "partition %d of %s is in use"
                                           : "the kernel does not let go of partition %d of %s",
                            item.number, pDisk->szPath);
        }
        (void)PartitionPush(&forgotten, item); // has the capacity of the list it comes from
    }
    return 0;
}

int KernelAdd(const DISK *pDisk, const TABLE *pTable, const PARTITION_LIST *pPlan)
{
    PARTITION_LIST known = {};

    if (!pDisk->fBlock) {
        return 0;
    }
    if (KernelListRead(pDisk, &known) != 0) {
        return 1;
    }
    for (int i = 0; i < pPlan->nItem; i++) {
        const PARTITION &item = pPlan->items[i];
        const u64 sectors = KernelSizeGet(pTable, item);
        if (sectors == 0 || PartitionFind(&known, item.number)) {
            continue;
        }
        if (PartitionAnnounce(pDisk, item, sectors) != 0) {
            return 1;
        }
    }
    return 0;
}
