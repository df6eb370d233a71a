// SPDX-License-Identifier: MIT
#pragma once

// Two lists as one.

#include "nurocore/szlist_base.h"

constexpr int SZLIST_OR_NEW = 4096; // NLIBCSzListOr: leave both lists alone, make a new one

// Merges pOther into the list, or both into a new list with SZLIST_OR_NEW (the caller frees it).
// Returns the result, NULL on failure: ERR_BAD_PARAMETER for NULL or for lists that are sorted in
// different ways, ERR_OUT_OF_MEMORY, and no code when two lists sorted without regard to case are
// given up. A failure in place leaves a valid list with what was merged so far, and of two sorted
// lists one in mode SZLIST_UNSORTED.
//
//     PNLIBSZLIST pAll = NLIBCSzListOr(&pDisks, pMore, SZLIST_OR_NEW); // both stay as they are
//     if (NLIBCSzListOr(&pDisks, pMore, 0) == nullptr) {               // pDisks follows its block
//         return -1;
//     }
PNLIBSZLIST NLIBCSzListOr(PNLIBSZLIST *ppList, const NLIBSZLIST *pOther, int flags);
