// SPDX-License-Identifier: MIT
#pragma once

// String lists of a test, and what must hold for the block of every list between two calls.

#include "nurocore/szlist.h"

#include <cstring>
#include <malloc.h>
#include <string>
#include <vector>

using ITEMS = std::vector<std::string>;

constexpr i32 SLOTS_START = 24; // the header's six 32-bit words
constexpr i32 SLOT_SIZE = 4;

// Freed memory is overwritten at once, so that a text read from it is seen to be gone.
struct FREED_MEMORY_SCOPE {
    FREED_MEMORY_SCOPE()
    {
        (void)mallopt(M_PERTURB, 0x55);
    }
    FREED_MEMORY_SCOPE(const FREED_MEMORY_SCOPE &) = delete;
    FREED_MEMORY_SCOPE &operator=(const FREED_MEMORY_SCOPE &) = delete;
    ~FREED_MEMORY_SCOPE()
    {
        (void)mallopt(M_PERTURB, 0);
    }
};

// A list that is freed with its scope; p may move like any caller's pointer.
struct TEST_LIST {
    PNLIBSZLIST p;

    explicit TEST_LIST(int nSize = 512) : p(NLIBCSzListAlloc(nSize))
    {
    }
    // The items as they stand, then put into the mode.
    TEST_LIST(const ITEMS &items, int fMode) : TEST_LIST()
    {
        for (const std::string &item : items) {
            (void)NLIBCSzListPush(&p, item.c_str());
        }
        if (fMode != SZLIST_UNSORTED) {
            NLIBCSzListSort(p, fMode);
        }
    }
    TEST_LIST(const TEST_LIST &) = delete;
    TEST_LIST &operator=(const TEST_LIST &) = delete;
    ~TEST_LIST()
    {
        NLIBCSzListFree(p);
    }
};

inline ITEMS ItemsOf(const NLIBSZLIST *pList)
{
    ITEMS items;
    for (int i = 0; i < pList->nItem; i++) {
        items.emplace_back(NLIBCSzListGet(pList, i));
    }
    return items;
}

inline i32 SlotOf(const NLIBSZLIST *pList, int index)
{
    i32 offset = 0;
    const char *const pSlot =
        reinterpret_cast<const char *>(pList) + SLOTS_START + SLOT_SIZE * index;
    memcpy(&offset, pSlot, sizeof(offset));
    return offset;
}

inline bool IsEmptySlot(const NLIBSZLIST *pList, int index)
{
    return SlotOf(pList, index) == pList->pszEmpty;
}

// What is wrong with the block; empty when nothing is.
inline std::string Defect(const NLIBSZLIST *pList)
{
    const char *const pBlock = reinterpret_cast<const char *>(pList);
    if (pList->nSize < 512 || pList->nItem < 0 || pList->nFree < 0) {
        return "a count is out of range";
    }
    if (pList->pszEmpty != pList->nSize - 1 || pBlock[pList->pszEmpty] != '\0') {
        return "the empty item is not the zero byte at the block's end";
    }
    const i32 slotsEnd = SLOTS_START + SLOT_SIZE * pList->nItem;
    if (slotsEnd + pList->nFree != pList->EndofFree || pList->EndofFree > pList->nSize) {
        return "header, slots, free bytes and strings do not add up to the block";
    }
    for (int i = 0; i < pList->nItem; i++) {
        const i32 offset = SlotOf(pList, i);
        const bool isInside = offset >= pList->EndofFree && offset < pList->nSize;
        if (!isInside && offset != pList->pszEmpty) {
            return "slot " + std::to_string(i) + " points outside the strings";
        }
        if (memchr(pBlock + offset, '\0', static_cast<size_t>(pList->nSize - offset)) == nullptr) {
            return "string " + std::to_string(i) + " has no end";
        }
    }
    return "";
}
