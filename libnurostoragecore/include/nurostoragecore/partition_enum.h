// SPDX-License-Identifier: MIT
#pragma once

// The block devices that the kernel lists.

#include "nurocore/szlist.h"
#include "nurocore/types.h"

struct PARTITION_ENUM_FILTER {
    const char *szPrefix; // of the names to keep; NULL keeps all
    u32 containerMask;    // DISK_CONTAINER_* to keep; 0 keeps all
};

// Sorts the list in byte order, then adds "/dev/<name>" of every device that the filter keeps (NULL
// keeps all). Returns the number of items that the list has then, or -1: no code for NULL or when
// the kernel lists nothing, else the code of the call that failed.
int PartitionPathEnum(const PARTITION_ENUM_FILTER *pFilter, PNLIBSZLIST *ppList);
