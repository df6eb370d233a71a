// SPDX-License-Identifier: MIT
#pragma once

// The partition table of one disk, in memory until TableWrite.

#include "disk.h"

#include <libfdisk/libfdisk.h>

enum TABLE_LABEL {
    TABLE_NONE,    // nothing that the kernel would take for a partition table
    TABLE_MSDOS,   // the only kind that is changed
    TABLE_FOREIGN, // GPT and the like, also an ms-dos table that only protects a GPT
};

struct FDISK_CONTEXT_DELETER {
    void operator()(fdisk_context *pContext) const
    {
        fdisk_unref_context(pContext);
    }
};

struct TABLE {
    std::unique_ptr<fdisk_context, FDISK_CONTEXT_DELETER> pContext;
    const char *szPath;
    int fd;
    TABLE_LABEL label;
    u64 sectors;     // of the whole disk
    u64 unit;        // sectors of 512 bytes in one sector of the disk: 1, or 8
    bool fChanged;   // TableWrite has a table to write
    bool fFindGhost; // TableWrite wipes the headers that an earlier GPT left
};

int TableOpen(const DISK *pDisk, bool fWrite, TABLE *pTable);

// The partitions as they are in memory, the logical ones numbered from 5 up. A partition whose
// label has no ms-dos types gets the type of the protective entry, ee.
int TableRead(const TABLE *pTable, PARTITION_LIST *pList);

// Starts over with an empty ms-dos table. TableWrite will wipe everything that other programs take
// for a signature of the whole disk.
int TableRenew(TABLE *pTable);

// The caller has made sure that the number is 1 to 4 and that the place is free and below
// TableRoomGet.
int TableAdd(TABLE *pTable, const PARTITION &partition);

// Deleting an extended partition deletes the logical ones in it; deleting a logical one lowers the
// number of each one after it by 1.
int TableDelete(TABLE *pTable, int number);

// The first sector that no partition can have any more: the end of the disk, or the last sector of
// 2 TiB on a disk with 512-byte sectors (an entry counts in 32 bits), whichever comes first.
u64 TableRoomGet(const TABLE *pTable);

// When this returns, everything is on the disk, not only in memory.
int TableWrite(const TABLE *pTable);
