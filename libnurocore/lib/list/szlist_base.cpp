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
// Invariants between two calls:
//   - 24 + 4 * nItem + nFree + (nSize - EndofFree) == nSize; the bytes of strings that were removed
//     or replaced are unused, but count as strings until the next growth drops them;
//   - the last byte of the block is 0; a slot that holds its offset is empty. The first string
//     stored ends in that byte, so if it is empty, its slot counts as an empty one.
#include "nurocore/szlist_base.h"

#include "nurocore/error.h"
#include "nurocore/handle.h"
#include "nurocore/types.h"
#include "szlist_internal.h"

#include <algorithm>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace
{

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

constexpr i32 LIST_SIZE_MIN = 512;
constexpr i32 LIST_HEADER_SIZE = sizeof(NLIBSZLIST);
constexpr i32 LIST_SLOT_SIZE = sizeof(i32);

// Kept: the case-insensitive search and merge treat a difference of exactly -2 as a failure, so
// such a list may miss an item and hold it twice. Existing lists rely on the resulting order.
constexpr int COMPARE_FAILED = -2;

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
// that differ. The binary search and the merge look at that value.
int CompareNoCase(const char *szKey, const char *szItem)
{
    while (*szKey != '\0' && LowerCase(*szKey) == LowerCase(*szItem)) {
        szKey++;
        szItem++;
    }
    return LowerCase(*szKey) - LowerCase(*szItem);
}

// Two's complement, so that 0 means "would be the first".
i32 NotFoundAt(i32 low)
{
    return ~low;
}

// Index of an item that equals szKey, else the complement of where it belongs; -1 when empty.
i32 BinarySearch(const NLIBSZLIST *pList, const char *szKey, SZLIST_COMPARE pCompare)
{
    i32 low = 0;
    i32 high = pList->nItem - 1;

    while (low <= high) {
        const i32 middle = low + (high - low) / 2;
        const int difference = pCompare(szKey, SzListItem(pList, middle));
        if (difference == 0) {
            return middle;
        }
        if (SzListIsCompareFailed(pCompare, difference)) {
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

i32 LinearSearch(const NLIBSZLIST *pList, const char *szKey, SZLIST_COMPARE pCompare)
{
    for (i32 i = 0; i < pList->nItem; i++) {
        if (!SzListIsEmptySlot(pList, i) && pCompare(szKey, SzListItem(pList, i)) == 0) {
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

// Copies szItem below the strings; the caller adjusts nFree. szItem may lie in the block.
i32 StringStore(PNLIBSZLIST pList, const char *szItem, size_t cbItem)
{
    pList->EndofFree -= static_cast<i32>(cbItem);
    memmove(At(pList, pList->EndofFree), szItem, cbItem);
    return pList->EndofFree;
}

// A copy of the list, without its unused string bytes, in a block of twice the size.
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
        if (SzListIsEmptySlot(pList, i)) {
            Slots(pNew)[i] = pNew->pszEmpty;
            continue;
        }
        const size_t cbItem = strlen(SzListItem(pList, i)) + 1;
        Slots(pNew)[i] = StringStore(pNew, SzListItem(pList, i), cbItem);
        pNew->nFree -= static_cast<i32>(cbItem);
    }
    return pNew;
}

// Doubles the list until nNeeded bytes are free. The first block is not freed but handed to pStart,
// because the string to be stored may lie in it.
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

int InsertPlace(const NLIBSZLIST *pList, int index, const char *szItem)
{
    if (!SzListIsSortedMode(pList->fMode)) {
        return index;
    }
    const i32 found = BinarySearch(pList, szItem, SzListCompareOf(pList->fMode));
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
    SZLIST_COMPARE pCompare;

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

// Not qsort: this is stable with every libc, and does not allocate memory, which could fail.
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

void Sort(PNLIBSZLIST pList, SZLIST_COMPARE pCompare)
{
    SlotsSort(Slots(pList), Slots(pList) + pList->nItem, {.pList = pList, .pCompare = pCompare});
}

} // namespace

const char *SzListItem(const NLIBSZLIST *pList, i32 index)
{
    return At(pList, Slots(pList)[index]);
}

bool SzListIsEmptySlot(const NLIBSZLIST *pList, i32 index)
{
    return Slots(pList)[index] == pList->pszEmpty;
}

bool SzListIsSortedMode(int fMode)
{
    return fMode == SZLIST_SORTED || fMode == SZLIST_CASE_SORTED;
}

SZLIST_COMPARE SzListCompareOf(int fMode)
{
    return fMode == SZLIST_CASE_SORTED ? CompareNoCase : strcmp;
}

bool SzListIsCompareFailed(SZLIST_COMPARE pCompare, int difference)
{
    return pCompare == CompareNoCase && difference == COMPARE_FAILED;
}

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
    return SzListItem(pList, index);
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
    const char *const szRemoved = SzListItem(pList, index);
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
    if (cbItem <= strlen(SzListItem(pList, index)) + 1) {
        memmove(At(pList, Slots(pList)[index]), szItem, cbItem);
    } else {
        // Kept: the list does not grow here and room is not checked; callers look at nFree.
        Slots(pList)[index] = StringStore(pList, szItem, cbItem);
        pList->nFree -= static_cast<i32>(cbItem);
    }
    if (!SzListIsSortedMode(pList->fMode)) {
        return index;
    }
    // szItem may lie in the list: sorting moves slots, never strings.
    Sort(pList, SzListCompareOf(pList->fMode));
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

int NLIBCSzListDump(const NLIBSZLIST *pList)
{
    if (pList == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    (void)printf("%p start address \n", static_cast<const void *>(pList));
    for (i32 i = 0; i < pList->nItem; i++) {
        (void)printf("%p ,%p pszItem[%i]=%s\n", static_cast<const void *>(SzListItem(pList, i)),
                     static_cast<const void *>(Slots(pList) + i), i, SzListItem(pList, i));
    }
    return printf("nSize =%i \t nItem =%i \t nFree =%i \t fMode =%i \t EndofFree=%p\n",
                  pList->nSize, pList->nItem, pList->nFree, pList->fMode,
                  static_cast<const void *>(At(pList, pList->EndofFree)));
}
