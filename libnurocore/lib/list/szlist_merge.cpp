// SPDX-License-Identifier: MIT
#include "nurocore/szlist_merge.h"

#include "nurocore/error.h"
#include "nurocore/szlist_base.h"
#include "nurocore/types.h"
#include "szlist_internal.h"

#include <algorithm>
#include <climits>

namespace
{

bool PushAll(PNLIBSZLIST *ppResult, const NLIBSZLIST *pFrom)
{
    for (i32 i = 0; i < pFrom->nItem; i++) {
        if (!SzListIsEmptySlot(pFrom, i) && NLIBCSzListPush(ppResult, SzListItem(pFrom, i)) < 0) {
            return false;
        }
    }
    return true;
}

// Two lists in one order: the result gets what only pOther holds, in place or all of both.
bool MergeSorted(const NLIBSZLIST *pThis, const NLIBSZLIST *pOther, SZLIST_COMPARE pCompare,
                 bool fNew, PNLIBSZLIST *ppResult)
{
    const i32 nThis = pThis->nItem;
    i32 i = 0;
    i32 j = 0;
    while (j < pOther->nItem || (fNew && i < nThis)) {
        // In place, pThis is the result and may have moved.
        const NLIBSZLIST *const pLeft = fNew ? pThis : *ppResult;
        int difference = 0;
        if (i == nThis) {
            difference = 1;
        } else if (j == pOther->nItem) {
            difference = -1;
        } else {
            difference = pCompare(SzListItem(pLeft, i), SzListItem(pOther, j));
            if (SzListIsCompareFailed(pCompare, difference)) {
                return false;
            }
        }
        const bool fTakeOther = difference > 0;
        const char *const szTaken = fTakeOther ? SzListItem(pOther, j) : SzListItem(pLeft, i);
        if ((fTakeOther || fNew) && NLIBCSzListPush(ppResult, szTaken) < 0) {
            return false;
        }
        i += difference <= 0 ? 1 : 0;
        j += difference >= 0 ? 1 : 0;
    }
    return true;
}

bool OrSameOrder(PNLIBSZLIST *ppList, const NLIBSZLIST *pOther, bool fNew, PNLIBSZLIST *ppResult)
{
    const int fMode = (*ppList)->fMode;
    if (!fNew) {
        // Not re-sorted, so that pushed items go to the end and do not shift what is still to be
        // read.
        (*ppResult)->fMode = SZLIST_UNSORTED;
    }
    const bool isMerged = MergeSorted(*ppList, pOther, SzListCompareOf(fMode), fNew, ppResult);
    // A merge that was given up leaves the list unsorted, and its mode says so.
    if (isMerged) {
        NLIBCSzListSort(*ppResult, fMode);
    }
    return isMerged;
}

int FindInOrderOf(const NLIBSZLIST *pOther, const char *szItem)
{
    return pOther->fMode == SZLIST_CASE_SORTED ? NLIBCSzListCaseFind(pOther, szItem)
                                               : NLIBCSzListFind(pOther, szItem);
}

// All of the sorted pOther, then what only the unsorted list held.
bool OrSortedOther(const NLIBSZLIST *pThis, const NLIBSZLIST *pOther, int flags,
                   PNLIBSZLIST *ppResult)
{
    if (!SzListIsSortedMode(pOther->fMode)) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return false;
    }
    const i32 nThis = pThis->nItem;
    if (!PushAll(ppResult, pOther)) {
        return false;
    }
    if (flags == SZLIST_OR_NEW) {
        for (i32 i = 0; i < nThis; i++) {
            if (!SzListIsEmptySlot(pThis, i) && FindInOrderOf(pOther, SzListItem(pThis, i)) < 0 &&
                NLIBCSzListPush(ppResult, SzListItem(pThis, i)) < 0) {
                return false;
            }
        }
    } else if (flags == 0) {
        // Backward, so that a removal does not shift the slots that are still to be read.
        for (i32 i = nThis - 1; i >= 0; i--) {
            if (FindInOrderOf(pOther, SzListItem(*ppResult, i)) >= 0) {
                (void)NLIBCSzListRemove(*ppResult, i);
            }
        }
    }
    return true;
}

// pOther is unsorted: adds those of its items that the result does not hold yet.
bool OrMissing(PNLIBSZLIST *ppResult, const NLIBSZLIST *pOther)
{
    for (i32 i = 0; i < pOther->nItem; i++) {
        const char *const szItem = SzListItem(pOther, i);
        if (SzListIsEmptySlot(pOther, i) || FindInOrderOf(*ppResult, szItem) >= 0) {
            continue;
        }
        if (NLIBCSzListPush(ppResult, szItem) < 0) {
            return false;
        }
    }
    return true;
}

bool Or(PNLIBSZLIST *ppList, const NLIBSZLIST *pOther, int flags, PNLIBSZLIST *ppResult)
{
    const NLIBSZLIST *const pThis = *ppList;
    const bool fNew = flags == SZLIST_OR_NEW;

    if (pThis->fMode == SZLIST_UNSORTED && pOther->fMode != SZLIST_UNSORTED) {
        return OrSortedOther(pThis, pOther, flags, ppResult);
    }
    if (pThis->fMode != SZLIST_UNSORTED && pOther->fMode != SZLIST_UNSORTED) {
        return OrSameOrder(ppList, pOther, fNew, ppResult);
    }
    if (pThis->fMode == SZLIST_UNSORTED && fNew) {
        return PushAll(ppResult, pThis) && PushAll(ppResult, pOther);
    }
    if (fNew) {
        (*ppResult)->fMode = pThis->fMode;
        return PushAll(ppResult, pThis) && OrMissing(ppResult, pOther);
    }
    return OrMissing(ppResult, pOther);
}

} // namespace

PNLIBSZLIST NLIBCSzListOr(PNLIBSZLIST *ppList, const NLIBSZLIST *pOther, int flags)
{
    if (ppList == nullptr || *ppList == nullptr || pOther == nullptr ||
        ((*ppList)->fMode != 0 && pOther->fMode != 0 && (*ppList)->fMode != pOther->fMode)) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return nullptr;
    }
    if (flags != SZLIST_OR_NEW) {
        NLIBCSzListCompact(*ppList);
        return Or(ppList, pOther, flags, ppList) ? *ppList : nullptr;
    }
    const i64 nUsed =
        static_cast<i64>((*ppList)->nSize) - (*ppList)->nFree + pOther->nSize - pOther->nFree;
    PNLIBSZLIST pNew = NLIBCSzListAlloc(static_cast<int>(std::min<i64>(nUsed, INT_MAX)));
    if (pNew == nullptr) {
        return nullptr;
    }
    if (!Or(ppList, pOther, flags, &pNew)) {
        NLIBCSzListFree(pNew);
        return nullptr;
    }
    return pNew;
}
