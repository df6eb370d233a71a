// SPDX-License-Identifier: MIT
#pragma once

// Tables of a test, and what must hold for the block of every table between two calls.

#include "nurocore/hash.h"

#include "test_szlist.h"

#include <string>

// A table that is freed with its scope; p may move like any caller's pointer.
struct TEST_HASH {
    PNLIBHASH p;

    explicit TEST_HASH(PNLIBHASH pIn = NLIBCHashAlloc(0)) : p(pIn)
    {
    }
    TEST_HASH(const TEST_HASH &) = delete;
    TEST_HASH &operator=(const TEST_HASH &) = delete;
    ~TEST_HASH()
    {
        NLIBCHashFree(p);
    }
};

inline ITEMS KeysOf(const NLIBHASH *pHash)
{
    TEST_LIST list;
    (void)NLIBCHashKeyListGet(pHash, &list.p);
    return ItemsOf(list.p);
}

inline std::string ValueOf(const NLIBHASH *pHash, const std::string &key)
{
    const char *const pszValue = NLIBCHashGet(pHash, key.c_str());
    return pszValue == nullptr ? "(none)" : pszValue;
}

// What is wrong with the block; empty when nothing is.
inline std::string Defect(const NLIBHASH *pHash)
{
    const auto *const pSlots = reinterpret_cast<const NLIBHASH_SLOT *>(pHash + 1);
    const char *const pPool = reinterpret_cast<const char *>(pSlots + pHash->nSlot);
    if (pHash->cbFree < 0 || pHash->pPoolNext != pPool + (pHash->cbPool - pHash->cbFree)) {
        return "the pool's free bytes do not add up";
    }
    const auto IsInPool = [&](const char *p) { return p >= pPool && p < pHash->pPoolNext; };
    int nUsed = 0;
    for (int i = 0; i < pHash->nSlot; i++) {
        if (pSlots[i].pszKey == nullptr && pSlots[i].pszValue == nullptr) {
            continue;
        }
        nUsed++;
        if (!IsInPool(pSlots[i].pszKey) || !IsInPool(pSlots[i].pszValue)) {
            return "slot " + std::to_string(i) + " points outside the pool";
        }
        if (NLIBCHashGet(pHash, pSlots[i].pszKey) != pSlots[i].pszValue) {
            return "slot " + std::to_string(i) + " is not found by its key";
        }
    }
    return nUsed == pHash->nEntry ? "" : "the entry count is wrong";
}
