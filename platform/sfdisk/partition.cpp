// SPDX-License-Identifier: MIT
#include "partition.h"

#include <cstdarg>
#include <cstdio>

const PARTITION *PartitionFind(const PARTITION_LIST *pList, int number)
{
    for (int i = 0; i < pList->nItem; i++) {
        if (pList->items[i].number == number) {
            return &pList->items[i];
        }
    }
    return nullptr;
}

const PARTITION *PartitionAtSector(const PARTITION_LIST *pList, u64 sector)
{
    for (int i = 0; i < pList->nItem; i++) {
        const PARTITION &item = pList->items[i];
        if (sector >= item.start && sector - item.start < item.sectors) {
            return &item;
        }
    }
    return nullptr;
}

int PartitionPush(PARTITION_LIST *pList, const PARTITION &partition)
{
    if (pList->nItem == PARTITION_MAX) {
        return Complain("more than %d partitions", PARTITION_MAX);
    }
    pList->items[pList->nItem++] = partition;
    return 0;
}

int Complain(const char *szFormat, ...)
{
    // One write for the whole line: several partitioners may run at once on one terminal.
    char szLine[512];
    va_list args;
    va_start(args, szFormat);
    vsnprintf(szLine, sizeof(szLine), szFormat, args);
    va_end(args);
    fprintf(stderr, "sfdisk: %s\n", szLine);
    return 1;
}
