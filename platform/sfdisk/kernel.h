// SPDX-License-Identifier: MIT
#pragma once

// What the kernel knows of the partitions of a disk, changed one partition at a time, so that
// the others may be in use. Both do nothing for an image file.

#include "table.h"

// Makes the kernel forget every partition that the plan does not have, or has elsewhere. When one
// of them is in use the kernel gets those back that it had forgotten already: all or nothing.
int KernelDrop(const DISK *pDisk, const TABLE *pTable, const PARTITION_LIST *pPlan);

// Tells the kernel of every partition of the plan that it does not know, and waits until their
// nodes are in /dev.
int KernelAdd(const DISK *pDisk, const TABLE *pTable, const PARTITION_LIST *pPlan);
