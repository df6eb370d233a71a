// SPDX-License-Identifier: MIT
//
// The appliance's partitioner: makes, deletes and shows single entries of an ms-dos table.
// Every command checks all it can before the first change; one that is refused changes nothing.
#include "disk.h"
#include "kernel.h"
#include "options.h"
#include "partition.h"
#include "table.h"

#include <cstdio>
#include <cstdlib>
#include <memory>

namespace
{

constexpr int CREATED_NUMBER_MAX = 4; // no logical partitions are made

struct HEAP_DELETER {
    void operator()(char *szText) const
    {
        free(szText);
    }
};

unsigned long long Shown(u64 sectors)
{
    return sectors;
}

int MsdosRequire(const DISK *pDisk, const TABLE *pTable)
{
    return pTable->label == TABLE_MSDOS
               ? 0
               : Complain("%s has no ms-dos partition table", pDisk->szPath);
}

// The kernel drops partitions before the table is written and adds partitions after it, so that it
// never offers one that is not in the table on the disk. A run that is cut short leaves a table
// that the next run repairs.
int Commit(const DISK *pDisk, const TABLE *pTable)
{
    PARTITION_LIST plan = {};
    if (TableRead(pTable, &plan) != 0 || KernelDrop(pDisk, pTable, &plan) != 0 ||
        TableWrite(pTable) != 0) {
        return 1;
    }
    return KernelAdd(pDisk, pTable, &plan);
}

// An entry may extend beyond the end of the disk (one that lost sectors, for instance), but must
// not begin there or at the table itself.
bool EntryIsValid(const TABLE *pTable, const PARTITION &entry)
{
    return entry.type != 0 && entry.start != 0 && entry.start < pTable->sectors;
}

int EntriesPrune(TABLE *pTable, int *pKept)
{
    PARTITION_LIST list = {};
    *pKept = 0;
    if (TableRead(pTable, &list) != 0) {
        return 1;
    }
    for (int i = list.nItem - 1; i >= 0; i--) {
        if (EntryIsValid(pTable, list.items[i])) {
            ++*pKept;
        } else if (TableDelete(pTable, list.items[i].number) != 0) {
            return 1;
        }
    }
    return 0;
}

int CommandSign(DISK *pDisk, TABLE *pTable, const REQUEST *)
{
    int nKept = 0;
    if (pTable->label == TABLE_MSDOS && EntriesPrune(pTable, &nKept) != 0) {
        return 1;
    }
    // With nothing to keep, the disk gets a new table and loses its old signatures, so that none of
    // them turns up in the new partitions; it must not be in use then.
    if (nKept == 0 && (DiskClaim(pDisk) != 0 || TableRenew(pTable) != 0)) {
        return 1;
    }
    pTable->fFindGhost = true;
    return Commit(pDisk, pTable);
}

// Where the new partition begins: counted from the end of the one before it, the first partition
// from the start of the disk.
int StartGet(const DISK *pDisk, const REQUEST *pRequest, const PARTITION_LIST *pList, u64 *pStart)
{
    u64 before = 0;
    if (pRequest->number > 1) {
        const PARTITION *pBefore = PartitionFind(pList, pRequest->number - 1);
        if (!pBefore) {
            return Complain("%s has no partition %d that partition %d could follow", pDisk->szPath,
                            pRequest->number - 1, pRequest->number);
        }
        before = pBefore->start + pBefore->sectors;
    }
    if (__builtin_add_overflow(before, pRequest->skip, pStart)) {
        return Complain("partition %d does not fit on %s", pRequest->number, pDisk->szPath);
    }
    return 0;
}

int RoomCheck(const DISK *pDisk, const TABLE *pTable, PARTITION *pNew)
{
    const u64 room = TableRoomGet(pTable);
    const u64 rest = pNew->start < room ? room - pNew->start : 0;
    if (pNew->sectors == SIZE_REST_OF_DISK) {
        pNew->sectors = rest - rest % pTable->unit;
    }
    if (pNew->start == 0 || pNew->sectors == 0 || pNew->sectors > rest) {
        return Complain("partition %d does not fit on %s: it begins at sector %llu of %llu",
                        pNew->number, pDisk->szPath, Shown(pNew->start), Shown(room));
    }
    if (pNew->start % pTable->unit != 0 || pNew->sectors % pTable->unit != 0) {
        return Complain("partition %d does not lie on whole sectors of %s", pNew->number,
                        pDisk->szPath);
    }
    return 0;
}

int OverlapCheck(const DISK *pDisk, const PARTITION_LIST *pList, const PARTITION &made)
{
    for (int i = 0; i < pList->nItem; i++) {
        const PARTITION &item = pList->items[i];
        if (made.start < item.start + item.sectors && item.start < made.start + made.sectors) {
            return Complain("partition %d would overlap partition %d of %s", made.number,
                            item.number, pDisk->szPath);
        }
    }
    return 0;
}

int CommandCreate(DISK *pDisk, TABLE *pTable, const REQUEST *pRequest)
{
    PARTITION_LIST list = {};
    PARTITION made = {pRequest->number, 0, pRequest->sectors, pRequest->type, false};

    if (made.number > CREATED_NUMBER_MAX) {
        return Complain("partition %d cannot be made, only 1 to %d", made.number,
                        CREATED_NUMBER_MAX);
    }
    if (MsdosRequire(pDisk, pTable) != 0 || TableRead(pTable, &list) != 0) {
        return 1;
    }
    // A partition is never replaced, not even by an equal one; it has to be deleted first.
    if (PartitionFind(&list, made.number)) {
        return Complain("partition %d of %s exists already", made.number, pDisk->szPath);
    }
    if (StartGet(pDisk, pRequest, &list, &made.start) != 0 ||
        RoomCheck(pDisk, pTable, &made) != 0 || OverlapCheck(pDisk, &list, made) != 0 ||
        TableAdd(pTable, made) != 0) {
        return 1;
    }
    return Commit(pDisk, pTable);
}

int CommandDelete(DISK *pDisk, TABLE *pTable, const REQUEST *pRequest)
{
    PARTITION_LIST list = {};
    if (pTable->label == TABLE_NONE) {
        return 0;
    }
    if (MsdosRequire(pDisk, pTable) != 0 || TableRead(pTable, &list) != 0) {
        return 1;
    }
    // From the last to the first, since deleting a logical partition renumbers those after it.
    for (int i = list.nItem - 1; i >= 0; i--) {
        const int number = list.items[i].number;
        if (number >= pRequest->firstDeleted && number <= pRequest->lastDeleted &&
            TableDelete(pTable, number) != 0) {
            return 1;
        }
    }
    return Commit(pDisk, pTable);
}

int CommandList(DISK *pDisk, TABLE *pTable, const REQUEST *pRequest)
{
    PARTITION_LIST list = {};
    if (TableRead(pTable, &list) != 0) {
        return 1;
    }
    const PARTITION *pFound = PartitionFind(&list, pRequest->number);
    if (!pFound) {
        return 0;
    }
    const std::unique_ptr<char, HEAP_DELETER> szName{
        fdisk_partname(pDisk->szPath, static_cast<size_t>(pFound->number))};
    if (!szName) {
        return Complain("out of memory");
    }
    printf("%s %llu %llu %llu %x\n", szName.get(), Shown(pFound->start),
           Shown(pFound->start + pFound->sectors - 1), Shown(pFound->sectors), pFound->type);
    return fflush(stdout) == 0 ? 0 : Complain("cannot write the line");
}

struct COMMAND_ROW {
    int (*pfnRun)(DISK *pDisk, TABLE *pTable, const REQUEST *pRequest);
    bool fWrite;
};

// In the order of COMMAND.
constexpr COMMAND_ROW COMMANDS[] = {
    {CommandSign, true},
    {CommandCreate, true},
    {CommandDelete, true},
    {CommandList, false},
};

} // namespace

int main(int argc, char **argv)
{
    REQUEST request = {};
    if (RequestRead(argc, argv, &request) != 0) {
        return 1;
    }
    const COMMAND_ROW &row = COMMANDS[request.command];
    DISK disk = {};
    TABLE table = {}; // after the disk, so that it is released before the descriptor it reads
    if (DiskOpen(request.szDisk, row.fWrite, &disk) != 0 ||
        TableOpen(&disk, row.fWrite, &table) != 0) {
        return 1;
    }
    return row.pfnRun(&disk, &table, &request);
}
