// SPDX-License-Identifier: MIT
#pragma once

// Two lists as one.

#include "nurocore/szlist_base.h"

constexpr int SZLIST_OR_NEW = 4096; // NLIBCSzListOr: leave both lists alone, make a new one

// Merges pOther into the list, or both into a new list with SZLIST_OR_NEW (the caller frees it).
// Returns the result, NULL on failure: ERR_BAD_PARAMETER for lists whose modes do not go together.
// A list in place then holds what was merged so far, unsorted.
PNLIBSZLIST NLIBCSzListOr(PNLIBSZLIST *ppList, const NLIBSZLIST *pOther, int flags);
