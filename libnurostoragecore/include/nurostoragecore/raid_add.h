// SPDX-License-Identifier: MIT
#pragma once

// Extending an array.

#include "nurocore/types.h"

// Adds a disk to an array that has redundancy, or grows a linear one. Returns 0, or -1: no code for
// NULL, for another level and when mdadm ran and failed, else that of RAIDInfoGet or SpaceExecv.
int RAIDAdd(const char *szMd, const char *szDisk);

// How many of nDisks hold redundancy at a level (RAID_LEVEL_*); -1 for an unknown level (no code).
int RAIDParityDiskCount(u32 level, int nDisks);
