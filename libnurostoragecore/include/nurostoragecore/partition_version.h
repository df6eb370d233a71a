// SPDX-License-Identifier: MIT
#pragma once

// Which layout version new system partitions get, so that they match the disks in use.

#include "nurocore/types.h"

// The caller sets *pVersion to 0 first. The members of a running system array decide; without one
// the largest version of all data disks with fChooseBiggest, else that of the first. Returns 0 with
// a version, or -1 (ERR_OUT_OF_MEMORY when memory runs out, else no code of its own).
int PartitionLayoutGetMax(u32 *pVersion, int fChooseBiggest);

// PartitionLayoutGetMax without fChooseBiggest.
int PartitionLayoutGet(u32 *pVersion);
