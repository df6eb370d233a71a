// SPDX-License-Identifier: MIT
#pragma once

// The block devices that the kernel lists.

#include "nurocore/szlist.h"
#include "nurocore/types.h"

struct PARTITION_ENUM_FILTER {
    const char *szPrefix; // of the names to keep; NULL keeps all
    u32 containerMask;    // DISK_CONTAINER_* to keep; 0 keeps all
};

// Adds "/dev/<name>" of every device that the filter (NULL: none) keeps to the list, which is put
// in byte order first. Returns the number of items the list has then, or -1 (code of what failed).
int PartitionPathEnum(const PARTITION_ENUM_FILTER *pFilter, PNLIBSZLIST *ppList);
