// SPDX-License-Identifier: MIT
#pragma once

// Which layout version new system partitions get, so that they match the disks in use.

#include "nurocore/types.h"

// The caller sets *pVersion to 0 before. Returns 0 with a version, or -1 (ERR_OUT_OF_MEMORY for
// want of memory, else no code of its own). With fChooseBiggest the largest version of all data
// disks decides, without it the first disk's.
int PartitionLayoutGetMax(u32 *pVersion, int fChooseBiggest);

// PartitionLayoutGetMax without fChooseBiggest.
int PartitionLayoutGet(u32 *pVersion);
