// SPDX-License-Identifier: MIT
#pragma once

// Changes the kernel's own list of a disk's partitions one partition at a time, so that the others
// may be in use. Both functions do nothing for an image file.

#include "table.h"

// Removes from the kernel every partition that the plan does not have, or has at another place. All
// or nothing: when one of them is in use, those already removed are added again.
int KernelDrop(const DISK *pDisk, const TABLE *pTable, const PARTITION_LIST *pPlan);

// Adds to the kernel every partition of the plan that it does not know, and waits until their nodes
// are in /dev.
int KernelAdd(const DISK *pDisk, const TABLE *pTable, const PARTITION_LIST *pPlan);
