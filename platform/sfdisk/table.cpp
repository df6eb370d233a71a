// SPDX-License-Identifier: MIT
#include "table.h"
#include "disk.h"
#include "partition.h"

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstring>
#include <memory>

namespace
{

constexpr u32 TYPE_PROTECTIVE = 0xee;

constexpr off_t MBR_FIRST_ENTRY = 446;
constexpr off_t MBR_ENTRY_SIZE = 16;
constexpr int MBR_ENTRIES = 4;
// An entry counts in 32 bits. Since 2.41 libfdisk makes no partition that ends on the very last of
// these sectors, and a disk gets the same table from every version.
constexpr u64 MBR_SECTORS = UINT32_MAX;

constexpr char GPT_SIGNATURE[] = {'E', 'F', 'I', ' ', 'P', 'A', 'R', 'T'};
constexpr size_t DISK_SECTOR_MAX = 4096;

struct FDISK_PARTITION_DELETER {
    void operator()(fdisk_partition *pPartition) const
    {
        fdisk_unref_partition(pPartition);
    }
};

struct FDISK_TYPE_DELETER {
    void operator()(fdisk_parttype *pType) const
    {
        fdisk_unref_parttype(pType);
    }
};

using FDISK_PARTITION_OWNER = std::unique_ptr<fdisk_partition, FDISK_PARTITION_DELETER>;
using FDISK_TYPE_OWNER = std::unique_ptr<fdisk_parttype, FDISK_TYPE_DELETER>;

// libfdisk returns 0, or a negative error number.
int FdiskCheck(const TABLE *pTable, int result, const char *szWhat)
{
    if (result == 0) {
        return 0;
    }
    return Complain("cannot %s %s: %s", szWhat, pTable->szPath, strerror(-result));
}

// The boot sector of a file system ends with the same two bytes as a partition table; only a
// table has nothing but 00 and 80 for the boot indicators. The kernel decides the same way.
bool BootIndicatorsAreValid(int fd)
{
    for (int i = 0; i < MBR_ENTRIES; i++) {
        unsigned char indicator = 0xff;
        if (pread(fd, &indicator, 1, MBR_FIRST_ENTRY + i * MBR_ENTRY_SIZE) != 1 ||
            (indicator & 0x7f) != 0) {
            return false;
        }
    }
    return true;
}

bool HasProtectiveEntry(const PARTITION_LIST *pList)
{
    const PARTITION *pEnd = pList->items + pList->nItem;
    return std::any_of(pList->items, pEnd, [](const PARTITION &item) {
        return item.number <= MBR_ENTRIES && item.type == TYPE_PROTECTIVE;
    });
}

int TableLabelGet(TABLE *pTable)
{
    PARTITION_LIST list = {};

    pTable->label = TABLE_NONE;
    if (!fdisk_has_label(pTable->pContext.get())) {
        return 0;
    }
    if (!fdisk_is_label(pTable->pContext.get(), DOS)) {
        pTable->label = TABLE_FOREIGN;
        return 0;
    }
    if (!BootIndicatorsAreValid(pTable->fd)) {
        return 0;
    }
    pTable->label = TABLE_MSDOS;
    if (TableRead(pTable, &list) != 0) {
        return 1;
    }
    if (HasProtectiveEntry(&list)) {
        pTable->label = TABLE_FOREIGN;
    }
    return 0;
}

int PartitionRead(const TABLE *pTable, size_t slot, PARTITION *pPartition)
{
    fdisk_partition *pRaw = nullptr;
    if (FdiskCheck(pTable, fdisk_get_partition(pTable->pContext.get(), slot, &pRaw),
                   "read the partition table of") != 0) {
        return 1;
    }
    const FDISK_PARTITION_OWNER pEntry{pRaw};
    fdisk_parttype *pType = fdisk_partition_get_type(pRaw);

    pPartition->number = static_cast<int>(slot) + 1;
    pPartition->start = fdisk_partition_get_start(pRaw) * pTable->unit;
    pPartition->sectors = fdisk_partition_get_size(pRaw) * pTable->unit;
    pPartition->fContainer = fdisk_partition_is_container(pRaw) != 0;
    pPartition->type = pType ? fdisk_parttype_get_code(pType) : 0;
    if (pTable->label == TABLE_FOREIGN && pPartition->type == 0) {
        pPartition->type = TYPE_PROTECTIVE;
    }
    return 0;
}

// libfdisk may move a partition to a place that it prefers.
int TableAddVerify(const TABLE *pTable, const PARTITION &wanted)
{
    PARTITION_LIST list = {};
    if (TableRead(pTable, &list) != 0) {
        return 1;
    }
    const PARTITION *pMade = PartitionFind(&list, wanted.number);
    if (!pMade || pMade->start != wanted.start || pMade->sectors != wanted.sectors ||
        pMade->type != wanted.type) {
        return Complain("partition %d cannot be made exactly as asked", wanted.number);
    }
    return 0;
}

// A header that lies in a partition is that partition's content.
int GhostWipe(const TABLE *pTable, const PARTITION_LIST *pList, u64 sector)
{
    char block[DISK_SECTOR_MAX];
    const size_t cbBlock = pTable->unit * SECTOR_SIZE;
    const auto offset = static_cast<off_t>(sector * SECTOR_SIZE);
    const auto cbExpected = static_cast<ssize_t>(cbBlock);

    if (cbBlock > sizeof(block) || PartitionAtSector(pList, sector) ||
        pread(pTable->fd, block, cbBlock, offset) != cbExpected ||
        memcmp(block, GPT_SIGNATURE, sizeof(GPT_SIGNATURE)) != 0) {
        return 0;
    }
    memset(block, 0, cbBlock);
    if (pwrite(pTable->fd, block, cbBlock, offset) != cbExpected) {
        return Complain("cannot wipe the GPT header at sector %llu of %s: %s",
                        static_cast<unsigned long long>(sector), pTable->szPath, strerror(errno));
    }
    return 0;
}

int GhostsWipe(const TABLE *pTable)
{
    PARTITION_LIST list = {};
    if (TableRead(pTable, &list) != 0) {
        return 1;
    }
    return GhostWipe(pTable, &list, pTable->unit) != 0 ||
                   GhostWipe(pTable, &list, pTable->sectors - pTable->unit) != 0
               ? 1
               : 0;
}

} // namespace

int TableOpen(const DISK *pDisk, bool fWrite, TABLE *pTable)
{
    pTable->pContext.reset(fdisk_new_context());
    if (!pTable->pContext) {
        return Complain("out of memory");
    }
    fdisk_context *pContext = pTable->pContext.get();
    pTable->szPath = pDisk->szPath;
    pTable->fd = pDisk->file.get().fd;
    fdisk_disable_dialogs(pContext, 1);
    if (FdiskCheck(pTable, fdisk_assign_device_by_fd(pContext, pTable->fd, pDisk->szPath, !fWrite),
                   "read") != 0) {
        return 1;
    }
    pTable->unit = fdisk_get_sector_size(pContext) / SECTOR_SIZE;
    pTable->sectors = fdisk_get_nsectors(pContext) * pTable->unit;
    return TableLabelGet(pTable);
}

int TableRead(const TABLE *pTable, PARTITION_LIST *pList)
{
    pList->nItem = 0;
    if (pTable->label == TABLE_NONE) {
        return 0;
    }
    const size_t nSlots = fdisk_get_npartitions(pTable->pContext.get());
    for (size_t slot = 0; slot < nSlots; slot++) {
        PARTITION partition = {};
        if (!fdisk_is_partition_used(pTable->pContext.get(), slot)) {
            continue;
        }
        if (PartitionRead(pTable, slot, &partition) != 0 || PartitionPush(pList, partition) != 0) {
            return 1;
        }
    }
    return 0;
}

int TableRenew(TABLE *pTable)
{
    fdisk_context *pContext = pTable->pContext.get();
    if (FdiskCheck(pTable, fdisk_create_disklabel(pContext, "dos"), "make an ms-dos table on") !=
            0 ||
        FdiskCheck(pTable, fdisk_enable_wipe(pContext, 1), "wipe the old signatures of") != 0) {
        return 1;
    }
    pTable->label = TABLE_MSDOS;
    pTable->fChanged = true;
    return 0;
}

int TableAdd(TABLE *pTable, const PARTITION &partition)
{
    fdisk_context *pContext = pTable->pContext.get();
    const FDISK_PARTITION_OWNER pNew{fdisk_new_partition()};
    const FDISK_TYPE_OWNER pType{fdisk_new_parttype()};
    if (!pNew || !pType) {
        return Complain("out of memory");
    }
    // Without this libfdisk refuses partitions that begin before the first mebibyte.
    fdisk_set_first_lba(pContext, 1);
    fdisk_parttype_set_code(pType.get(), static_cast<int>(partition.type));
    fdisk_partition_set_type(pNew.get(), pType.get());
    fdisk_partition_set_partno(pNew.get(), static_cast<size_t>(partition.number - 1));
    fdisk_partition_set_start(pNew.get(), partition.start / pTable->unit);
    fdisk_partition_set_size(pNew.get(), partition.sectors / pTable->unit);
    fdisk_partition_size_explicit(pNew.get(), 1);
    if (FdiskCheck(pTable, fdisk_add_partition(pContext, pNew.get(), nullptr),
                   "make the partition on") != 0) {
        return 1;
    }
    pTable->fChanged = true;
    return TableAddVerify(pTable, partition);
}

int TableDelete(TABLE *pTable, int number)
{
    pTable->fChanged = true;
    return FdiskCheck(
        pTable, fdisk_delete_partition(pTable->pContext.get(), static_cast<size_t>(number - 1)),
        "delete the partition of");
}

u64 TableRoomGet(const TABLE *pTable)
{
    return std::min(pTable->sectors, MBR_SECTORS * pTable->unit);
}

int TableWrite(const TABLE *pTable)
{
    if (pTable->fFindGhost && GhostsWipe(pTable) != 0) {
        return 1;
    }
    if (pTable->fChanged && FdiskCheck(pTable, fdisk_write_disklabel(pTable->pContext.get()),
                                       "write the table of") != 0) {
        return 1;
    }
    return fsync(pTable->fd) == 0
               ? 0
               : Complain("cannot write %s: %s", pTable->szPath, strerror(errno));
}
