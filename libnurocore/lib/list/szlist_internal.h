// SPDX-License-Identifier: MIT
#pragma once

// What joining and merging know of a list beside its public functions: where slots and strings lie,
// and which order a mode means.

#include "nurocore/szlist_base.h"

inline i32 *SzListSlots(PNLIBSZLIST pList)
{
    return reinterpret_cast<i32 *>(pList + 1);
}

inline const i32 *SzListSlots(const NLIBSZLIST *pList)
{
    return reinterpret_cast<const i32 *>(pList + 1);
}

inline char *SzListAt(PNLIBSZLIST pList, i32 offset)
{
    return reinterpret_cast<char *>(pList) + offset;
}

inline const char *SzListAt(const NLIBSZLIST *pList, i32 offset)
{
    return reinterpret_cast<const char *>(pList) + offset;
}

inline const char *SzListItem(const NLIBSZLIST *pList, i32 index)
{
    return SzListAt(pList, SzListSlots(pList)[index]);
}

inline bool SzListIsEmptySlot(const NLIBSZLIST *pList, i32 index)
{
    return SzListSlots(pList)[index] == pList->pszEmpty;
}

using SZLIST_COMPARE = int (*)(const char *, const char *);

bool SzListIsSortedMode(int fMode);

// By bytes, or without regard to case for SZLIST_CASE_SORTED.
SZLIST_COMPARE SzListCompareOf(int fMode);

// True for a result of the comparison that the binary search and the merge treat as a failure.
bool SzListIsCompareFailed(SZLIST_COMPARE pCompare, int difference);
