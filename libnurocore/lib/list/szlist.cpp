// SPDX-License-Identifier: MIT
//
// The block, lowest address first:
//
//   0      24          24 + 4 * nItem        EndofFree                    nSize
//   +------+------------------+-----------------+------------------------+-+
//   |header| slots, growing ->| nFree bytes     | <- strings, growing    |0|
//   +------+------------------+-----------------+------------------------+-+
//                                                                         ^ pszEmpty
//
// A slot is the 32-bit offset of its string from the start of the block. Offsets, not pointers:
// a block is moved by copying, and all sizes are the same on 32-bit and 64-bit machines.
//
// What holds between two calls:
//   - 24 + 4 * nItem + nFree + (nSize - EndofFree) == nSize; the bytes of strings that were removed
//     or replaced are dead, but count as strings until the next growth drops them;
//   - the last byte of the block is 0; a slot that holds its offset is empty. The first string
//     stored ends in that byte, so a first string of length 0 is an empty slot by identity.
#include "nurocore/szlist.h"

#include "nurocore/error.h"
#include "nurocore/handle.h"
#include "nurocore/log.h"

#include <algorithm>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace
{

constexpr i32 LIST_SIZE_MIN = 512;
constexpr i32 LIST_HEADER_SIZE = sizeof(NLIBSZLIST);
constexpr i32 LIST_SLOT_SIZE = sizeof(i32);

using COMPARE = int (*)(const char *, const char *);

i32 *Slots(PNLIBSZLIST pList)
{
    return reinterpret_cast<i32 *>(pList + 1);
}

const i32 *Slots(const NLIBSZLIST *pList)
{
    return reinterpret_cast<const i32 *>(pList + 1);
}

char *At(PNLIBSZLIST pList, i32 offset)
{
    return reinterpret_cast<char *>(pList) + offset;
}

const char *At(const NLIBSZLIST *pList, i32 offset)
{
    return reinterpret_cast<const char *>(pList) + offset;
}

const char *Item(const NLIBSZLIST *pList, i32 index)
{
    return At(pList, Slots(pList)[index]);
}

bool IsEmptySlot(const NLIBSZLIST *pList, i32 index)
{
    return Slots(pList)[index] == pList->pszEmpty;
}

bool IsIndexIn(const NLIBSZLIST *pList, int index)
{
    return pList != nullptr && index >= 0 && index < pList->nItem;
}

int LowerCase(char ch)
{
    const auto byte = static_cast<unsigned char>(ch);
    return byte >= 'A' && byte <= 'Z' ? byte - 'A' + 'a' : byte;
}

// Like strcasecmp, but the value returned is fixed: the difference of the first lower-cased bytes
// that differ. The search and the merge below look at that value.
int CompareNoCase(const char *szKey, const char *szItem)
{
    while (*szKey != '\0' && LowerCase(*szKey) == LowerCase(*szItem)) {
        szKey++;
        szItem++;
    }
    return LowerCase(*szKey) - LowerCase(*szItem);
}

// Kept on purpose: the case-insensitive search and merge take a difference of exactly -2 for a
// failure, so such lists may miss an item and hold it twice. Lists in use rely on their order.
constexpr int COMPARE_FAILED = -2;

bool IsCompareFailed(COMPARE pCompare, int difference)
{
    return pCompare == CompareNoCase && difference == COMPARE_FAILED;
}

// Two's complement, so that 0 means "would be the first".
i32 NotFoundAt(i32 low)
{
    return ~low;
}

// Index of an item that equals szKey, else the complement of where it belongs; -1 when empty.
i32 BinarySearch(const NLIBSZLIST *pList, const char *szKey, COMPARE pCompare)
{
    i32 low = 0;
    i32 high = pList->nItem - 1;

    while (low <= high) {
        const i32 middle = low + (high - low) / 2;
        const int difference = pCompare(szKey, Item(pList, middle));
        if (difference == 0) {
            return middle;
        }
        if (IsCompareFailed(pCompare, difference)) {
            break;
        }
        if (difference > 0) {
            low = middle + 1;
        } else {
            high = middle - 1;
        }
    }
    return NotFoundAt(low);
}

i32 LinearSearch(const NLIBSZLIST *pList, const char *szKey, COMPARE pCompare)
{
    for (i32 i = 0; i < pList->nItem; i++) {
        if (!IsEmptySlot(pList, i) && pCompare(szKey, Item(pList, i)) == 0) {
            return i;
        }
    }
    return -1;
}

void Reset(PNLIBSZLIST pList)
{
    pList->nItem = 0;
    pList->nFree = pList->nSize - LIST_HEADER_SIZE;
    pList->EndofFree = pList->nSize;
}

PNLIBSZLIST BlockAlloc(i32 nSize)
{
    const auto pList = static_cast<PNLIBSZLIST>(malloc(static_cast<size_t>(nSize)));
    if (pList == nullptr) {
        NLIBCErrSetHere(ERR_OUT_OF_MEMORY);
        return nullptr;
    }
    pList->nSize = nSize;
    pList->fMode = SZLIST_UNSORTED;
    pList->pszEmpty = nSize - 1;
    *At(pList, pList->pszEmpty) = '\0';
    Reset(pList);
    return pList;
}

// Copies szItem below the strings; nFree is the caller's to settle. szItem may lie in the block.
i32 StringStore(PNLIBSZLIST pList, const char *szItem, size_t cbItem)
{
    pList->EndofFree -= static_cast<i32>(cbItem);
    memmove(At(pList, pList->EndofFree), szItem, cbItem);
    return pList->EndofFree;
}

// A copy of the list, without its dead bytes, in a block of twice the size.
PNLIBSZLIST Grow(const NLIBSZLIST *pList)
{
    if (pList->nSize > INT_MAX / 2) {
        NLIBCErrSetHere(ERR_OUT_OF_MEMORY);
        return nullptr;
    }
    NLIBSZLIST *const pNew = BlockAlloc(pList->nSize * 2);
    if (pNew == nullptr) {
        return nullptr;
    }
    pNew->nItem = pList->nItem;
    pNew->fMode = pList->fMode;
    pNew->nFree -= pList->nItem * LIST_SLOT_SIZE;
    for (i32 i = 0; i < pList->nItem; i++) {
        if (IsEmptySlot(pList, i)) {
            Slots(pNew)[i] = pNew->pszEmpty;
            continue;
        }
        const size_t cbItem = strlen(Item(pList, i)) + 1;
        Slots(pNew)[i] = StringStore(pNew, Item(pList, i), cbItem);
        pNew->nFree -= static_cast<i32>(cbItem);
    }
    return pNew;
}

// Doubles the list until nNeeded bytes are free. The block it started from is handed out as
// pStart instead of being freed: the string to be stored may lie in it.
bool MakeRoom(PNLIBSZLIST *ppList, i64 nNeeded, HEAP_OWNER<NLIBSZLIST> &pStart)
{
    while (nNeeded > (*ppList)->nFree) {
        NLIBSZLIST *const pNew = Grow(*ppList);
        if (pNew == nullptr) {
            return false;
        }
        if (pStart == nullptr) {
            pStart.reset(*ppList);
        } else {
            NLIBCSzListFree(*ppList);
        }
        *ppList = pNew;
    }
    return true;
}

COMPARE CompareOf(int fMode)
{
    return fMode == SZLIST_CASE_SORTED ? CompareNoCase : strcmp;
}

bool IsSortedMode(int fMode)
{
    return fMode == SZLIST_SORTED || fMode == SZLIST_CASE_SORTED;
}

int InsertPlace(const NLIBSZLIST *pList, int index, const char *szItem)
{
    if (!IsSortedMode(pList->fMode)) {
        return index;
    }
    const i32 found = BinarySearch(pList, szItem, CompareOf(pList->fMode));
    return found < 0 ? ~found : found;
}

void SlotPut(PNLIBSZLIST pList, i32 index, i32 offset)
{
    i32 *const pSlots = Slots(pList);
    if (index < pList->nItem) {
        std::copy_backward(pSlots + index, pSlots + pList->nItem, pSlots + pList->nItem + 1);
        pList->nItem++;
    } else {
        std::fill(pSlots + pList->nItem, pSlots + index, pList->pszEmpty);
        pList->nItem = index + 1;
    }
    pSlots[index] = offset;
}

// Compares slots by their strings.
struct SLOT_LESS {
    const NLIBSZLIST *pList;
    COMPARE pCompare;

    bool operator()(i32 a, i32 b) const
    {
        return pCompare(At(pList, a), At(pList, b)) < 0;
    }
};

// Merges two sorted neighbours in place: the longer one is halved, the part of the other that
// belongs before that half is rotated in front of it, and both sides are merged in turn.
void NeighboursMerge(i32 *pFirst, i32 *pMiddle, i32 *pLast, SLOT_LESS isLess)
{
    if (pFirst == pMiddle || pMiddle == pLast) {
        return;
    }
    if (pLast - pFirst == 2) {
        if (isLess(*pMiddle, *pFirst)) {
            std::swap(*pFirst, *pMiddle);
        }
        return;
    }
    i32 *pLeft = pFirst + (pMiddle - pFirst) / 2;
    i32 *pRight = pMiddle + (pLast - pMiddle) / 2;
    if (pMiddle - pFirst > pLast - pMiddle) {
        pRight = std::lower_bound(pMiddle, pLast, *pLeft, isLess);
    } else {
        pLeft = std::upper_bound(pFirst, pMiddle, *pRight, isLess);
    }
    i32 *const pJoint = std::rotate(pLeft, pMiddle, pRight);
    NeighboursMerge(pFirst, pLeft, pJoint, isLess);
    NeighboursMerge(pJoint, pRight, pLast, isLess);
}

// Stable whatever libc's sort does, and without an allocation that could fail.
void SlotsSort(i32 *pFirst, i32 *pLast, SLOT_LESS isLess)
{
    if (std::is_sorted(pFirst, pLast, isLess)) {
        return;
    }
    i32 *const pMiddle = pFirst + (pLast - pFirst) / 2;
    SlotsSort(pFirst, pMiddle, isLess);
    SlotsSort(pMiddle, pLast, isLess);
    NeighboursMerge(pFirst, pMiddle, pLast, isLess);
}

void Sort(PNLIBSZLIST pList, COMPARE pCompare)
{
    SlotsSort(Slots(pList), Slots(pList) + pList->nItem, {.pList = pList, .pCompare = pCompare});
}

bool PushAll(PNLIBSZLIST *ppResult, const NLIBSZLIST *pFrom)
{
    for (i32 i = 0; i < pFrom->nItem; i++) {
        if (!IsEmptySlot(pFrom, i) && NLIBCSzListPush(ppResult, Item(pFrom, i)) < 0) {
            return false;
        }
    }
    return true;
}

} // namespace

PNLIBSZLIST NLIBCSzListAlloc(int nSize)
{
    return BlockAlloc(std::max(nSize, LIST_SIZE_MIN));
}

void NLIBCSzListFree(PNLIBSZLIST pList)
{
    free(pList);
}

int NLIBCSzListInsert(PNLIBSZLIST *ppList, int index, const char *szItem)
{
    if (ppList == nullptr || *ppList == nullptr || szItem == nullptr || index < 0) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    const size_t cbItem = strlen(szItem) + 1;
    const int place = InsertPlace(*ppList, index, szItem);
    const i64 nSlots =
        place < (*ppList)->nItem ? 1 : static_cast<i64>(place) - (*ppList)->nItem + 1;
    const i64 nNeeded = nSlots * LIST_SLOT_SIZE + static_cast<i64>(cbItem);

    HEAP_OWNER<NLIBSZLIST> pStart;
    if (!MakeRoom(ppList, nNeeded, pStart)) {
        return -1;
    }
    NLIBSZLIST *const pList = *ppList;
    SlotPut(pList, place, StringStore(pList, szItem, cbItem));
    pList->nFree -= static_cast<i32>(nNeeded);
    return place;
}

int NLIBCSzListPush(PNLIBSZLIST *ppList, const char *szItem)
{
    if (ppList == nullptr || *ppList == nullptr || szItem == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    return NLIBCSzListInsert(ppList, (*ppList)->nItem, szItem);
}

int NLIBCSzListPushHead(PNLIBSZLIST *ppList, const char *szItem)
{
    return NLIBCSzListInsert(ppList, 0, szItem);
}

const char *NLIBCSzListGet(const NLIBSZLIST *pList, int index)
{
    if (!IsIndexIn(pList, index)) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return nullptr;
    }
    return Item(pList, index);
}

int NLIBCSzListFind(const NLIBSZLIST *pList, const char *szItem)
{
    if (pList == nullptr || szItem == nullptr || pList->fMode == SZLIST_CASE_SORTED) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    if (pList->fMode == SZLIST_SORTED) {
        return std::max(BinarySearch(pList, szItem, strcmp), -1);
    }
    return LinearSearch(pList, szItem, strcmp);
}

int NLIBCSzListCaseFind(const NLIBSZLIST *pList, const char *szItem)
{
    if (pList == nullptr || szItem == nullptr || pList->fMode == SZLIST_SORTED) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    if (pList->fMode == SZLIST_CASE_SORTED) {
        return std::max(BinarySearch(pList, szItem, CompareNoCase), -1);
    }
    return LinearSearch(pList, szItem, CompareNoCase);
}

const char *NLIBCSzListRemove(PNLIBSZLIST pList, int index)
{
    if (!IsIndexIn(pList, index)) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return nullptr;
    }
    const char *const szRemoved = Item(pList, index);
    i32 *const pSlots = Slots(pList);
    std::copy(pSlots + index + 1, pSlots + pList->nItem, pSlots + index);
    pList->nItem--;
    pList->nFree += LIST_SLOT_SIZE;
    return szRemoved;
}

int NLIBCSzListSet(PNLIBSZLIST *ppList, int index, const char *szItem)
{
    if (ppList == nullptr || szItem == nullptr || !IsIndexIn(*ppList, index)) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    NLIBSZLIST *const pList = *ppList;
    const size_t cbItem = strlen(szItem) + 1;
    if (cbItem <= strlen(Item(pList, index)) + 1) {
        memmove(At(pList, Slots(pList)[index]), szItem, cbItem);
    } else {
        // Kept: no growth and no test for room here, callers see to nFree themselves.
        Slots(pList)[index] = StringStore(pList, szItem, cbItem);
        pList->nFree -= static_cast<i32>(cbItem);
    }
    if (!IsSortedMode(pList->fMode)) {
        return index;
    }
    // Found by its stored copy: sorting moves slots, not strings, so szItem may lie in the list.
    Sort(pList, CompareOf(pList->fMode));
    return NLIBCSzListFind(pList, szItem);
}

void NLIBCSzListSort(PNLIBSZLIST pList, int fMode)
{
    if (pList == nullptr) {
        return;
    }
    const bool isUnsorted = pList->fMode == SZLIST_UNSORTED;
    pList->fMode = fMode;
    if (!isUnsorted) {
        return;
    }
    NLIBCSzListCompact(pList);
    if ((fMode & SZLIST_SORTED) != 0) {
        Sort(pList, strcmp);
    } else if ((fMode & SZLIST_CASE_SORTED) != 0) {
        Sort(pList, CompareNoCase);
    }
}

void NLIBCSzListCompact(PNLIBSZLIST pList)
{
    if (pList == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return;
    }
    i32 *const pSlots = Slots(pList);
    i32 *const pEnd = std::remove(pSlots, pSlots + pList->nItem, pList->pszEmpty);
    const auto nKept = static_cast<i32>(pEnd - pSlots);
    pList->nFree += (pList->nItem - nKept) * LIST_SLOT_SIZE;
    pList->nItem = nKept;
}

void NLIBCSzListClear(PNLIBSZLIST pList)
{
    if (pList == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return;
    }
    Reset(pList);
}

PNLIBSZLIST NLIBCSzListExpand(PNLIBSZLIST pList)
{
    if (pList == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return nullptr;
    }
    NLIBSZLIST *const pNew = Grow(pList);
    if (pNew != nullptr) {
        NLIBCSzListFree(pList);
    }
    return pNew;
}

namespace
{

// Enlarges the caller's buffer to cbNeeded bytes; without memory it is freed and NULL.
bool JoinBufferEnlarge(char **pszBuf, int *pcbBuf, i64 cbNeeded)
{
    if (cbNeeded <= *pcbBuf) {
        return true;
    }
    void *const pNew =
        cbNeeded > INT_MAX ? nullptr : realloc(*pszBuf, static_cast<size_t>(cbNeeded));
    if (pNew == nullptr) {
        free(*pszBuf);
        *pszBuf = nullptr;
        return false;
    }
    *pszBuf = static_cast<char *>(pNew);
    *pcbBuf = static_cast<int>(cbNeeded);
    return true;
}

int JoinFailOutOfMemory()
{
    NLIBCErrSetHere(ERR_OUT_OF_MEMORY);
    NLIBCLog(LOG_ERR, "Out of memory!!");
    return -1;
}

} // namespace

int NLIBCSzListJoin(const NLIBSZLIST *pList, const char *szSeparator, char **pszBuf, int *pcbBuf)
{
    if (pList == nullptr || szSeparator == nullptr || pszBuf == nullptr || *pszBuf == nullptr ||
        pcbBuf == nullptr || *pcbBuf < 0) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        NLIBCLog(LOG_ERR, "Parameter error");
        return -1;
    }
    if (pList->nItem == 0) {
        return 0;
    }
    const size_t cchSeparator = strlen(szSeparator);
    const HEAP_OWNER<size_t> pUnits(
        static_cast<size_t *>(calloc(static_cast<size_t>(pList->nItem), sizeof(size_t))));
    if (pUnits == nullptr) {
        return JoinFailOutOfMemory();
    }
    i64 cbNeeded = 1;
    for (i32 i = 0; i < pList->nItem; i++) {
        pUnits.get()[i] = strlen(Item(pList, i)) + cchSeparator;
        cbNeeded += static_cast<i64>(pUnits.get()[i]);
    }
    if (!JoinBufferEnlarge(pszBuf, pcbBuf, cbNeeded)) {
        return JoinFailOutOfMemory();
    }
    memset(*pszBuf, 0, static_cast<size_t>(*pcbBuf));
    char *pszNext = *pszBuf;
    for (i32 i = 0; i < pList->nItem; i++) {
        const size_t cchItem = pUnits.get()[i] - cchSeparator;
        memcpy(pszNext, Item(pList, i), cchItem);
        memcpy(pszNext + cchItem, szSeparator, cchSeparator);
        pszNext += pUnits.get()[i];
    }
    *(pszNext - cchSeparator) = '\0';
    return static_cast<int>(cbNeeded);
}

int NLIBCSzListDump2Str(const NLIBSZLIST *pList, const char *szSeparator, char *szOut, int cbOut)
{
    if (pList == nullptr || szSeparator == nullptr || szOut == nullptr || cbOut < 1) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        NLIBCLog(LOG_ERR, "Parameter error");
        return -1;
    }
    const auto cbOutTotal = static_cast<size_t>(cbOut);
    memset(szOut, 0, cbOutTotal);
    size_t cchOut = 0;
    for (i32 i = 0; i < pList->nItem; i++) {
        const char *const szLead = i == 0 ? "" : szSeparator;
        const size_t cchUnit = strlen(szLead) + strlen(Item(pList, i));
        if (cchOut + cchUnit >= cbOutTotal) {
            NLIBCErrSetHere(ERR_OUT_OF_SPACE);
            return -1;
        }
        (void)snprintf(szOut + cchOut, cbOutTotal - cchOut, "%s%s", szLead, Item(pList, i));
        cchOut += cchUnit;
    }
    return static_cast<int>(cchOut);
}

namespace
{

// Two lists in one order: the result gets what only pOther holds, in place or all of both.
bool MergeSorted(const NLIBSZLIST *pThis, const NLIBSZLIST *pOther, COMPARE pCompare, bool fNew,
                 PNLIBSZLIST *ppResult)
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
            difference = pCompare(Item(pLeft, i), Item(pOther, j));
            if (IsCompareFailed(pCompare, difference)) {
                return false;
            }
        }
        const bool fTakeOther = difference > 0;
        const char *const szTaken = fTakeOther ? Item(pOther, j) : Item(pLeft, i);
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
        // Without a re-sort, so that what is pushed goes to the end and the walk stays in front.
        (*ppResult)->fMode = SZLIST_UNSORTED;
    }
    const bool isMerged = MergeSorted(*ppList, pOther, CompareOf(fMode), fNew, ppResult);
    // One that gave up leaves a list in no order, and says so by its mode.
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
    if (!IsSortedMode(pOther->fMode)) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return false;
    }
    const i32 nThis = pThis->nItem;
    if (!PushAll(ppResult, pOther)) {
        return false;
    }
    if (flags == SZLIST_OR_NEW) {
        for (i32 i = 0; i < nThis; i++) {
            if (!IsEmptySlot(pThis, i) && FindInOrderOf(pOther, Item(pThis, i)) < 0 &&
                NLIBCSzListPush(ppResult, Item(pThis, i)) < 0) {
                return false;
            }
        }
    } else if (flags == 0) {
        // Backward, so that a removal does not shift what is still to be looked at.
        for (i32 i = nThis - 1; i >= 0; i--) {
            if (FindInOrderOf(pOther, Item(*ppResult, i)) >= 0) {
                (void)NLIBCSzListRemove(*ppResult, i);
            }
        }
    }
    return true;
}

// pOther is unsorted and the result is in place or sorted: what it has not got yet is added.
bool OrMissing(PNLIBSZLIST *ppResult, const NLIBSZLIST *pOther)
{
    for (i32 i = 0; i < pOther->nItem; i++) {
        const char *const szItem = Item(pOther, i);
        if (IsEmptySlot(pOther, i) || FindInOrderOf(*ppResult, szItem) >= 0) {
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

int NLIBCSzListDump(const NLIBSZLIST *pList)
{
    if (pList == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    (void)printf("%p start address \n", static_cast<const void *>(pList));
    for (i32 i = 0; i < pList->nItem; i++) {
        (void)printf("%p ,%p pszItem[%i]=%s\n", static_cast<const void *>(Item(pList, i)),
                     static_cast<const void *>(Slots(pList) + i), i, Item(pList, i));
    }
    return printf("nSize =%i \t nItem =%i \t nFree =%i \t fMode =%i \t EndofFree=%p\n",
                  pList->nSize, pList->nItem, pList->nFree, pList->fMode,
                  static_cast<const void *>(At(pList, pList->EndofFree)));
}
