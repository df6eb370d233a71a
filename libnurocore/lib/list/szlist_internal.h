// SPDX-License-Identifier: MIT
#pragma once

// What joining and merging know of a list beside its public functions: its slots, and which order a
// mode means.

#include "nurocore/szlist_base.h"

// The string of a slot, which must be in use: index is not checked.
const char *SzListItem(const NLIBSZLIST *pList, i32 index);

bool SzListIsEmptySlot(const NLIBSZLIST *pList, i32 index);

using SZLIST_COMPARE = int (*)(const char *, const char *);

bool SzListIsSortedMode(int fMode);

// By bytes, or without regard to case for SZLIST_CASE_SORTED.
SZLIST_COMPARE SzListCompareOf(int fMode);

// True for a result of the comparison that the binary search and the merge treat as a failure.
bool SzListIsCompareFailed(SZLIST_COMPARE pCompare, int difference);
