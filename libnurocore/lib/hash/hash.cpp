// SPDX-License-Identifier: MIT
//
// One allocation, lowest address first: header, nSlot slots, cbPool bytes of texts. Texts are only
// ever appended; a value that is replaced by a longer one leaves its bytes unused. No key is ever
// deleted, so a search may stop at the first free slot.
#include "nurocore/hash.h"

#include "nurocore/error.h"
#include "nurocore/szlist_base.h"
#include "nurocore/types.h"

#include <algorithm>
#include <climits>
#include <cstdlib>
#include <cstring>
#include <utility>

namespace
{

constexpr int HASH_SLOTS_DEFAULT = 31;
constexpr int HASH_POOL_MIN = 512;
constexpr i64 HASH_HEADER_SIZE = sizeof(NLIBHASH);
constexpr i64 HASH_SLOT_SIZE = sizeof(NLIBHASH_SLOT);
constexpr float HASH_FREE_SLOT_RATIO_MIN = 0.25F;

NLIBHASH_SLOT *Slots(PNLIBHASH pHash)
{
    return reinterpret_cast<NLIBHASH_SLOT *>(pHash + 1);
}

const NLIBHASH_SLOT *Slots(const NLIBHASH *pHash)
{
    return reinterpret_cast<const NLIBHASH_SLOT *>(pHash + 1);
}

// In 64 bits, so that a table that does not fit its fields or the address space is noticed.
PNLIBHASH TableAlloc(i64 nSlot, i64 cbPool)
{
    // Kept: a crowded table of one slot cannot grow: 1 * 4 - 5 is negative.
    const bool fFieldsFit = nSlot >= 0 && nSlot <= INT_MAX && cbPool <= INT_MAX;
    const i64 cbTable = HASH_HEADER_SIZE + nSlot * HASH_SLOT_SIZE + cbPool;
    const auto pHash = fFieldsFit && std::in_range<size_t>(cbTable)
                           ? static_cast<PNLIBHASH>(calloc(1, static_cast<size_t>(cbTable)))
                           : nullptr;
    if (pHash == nullptr) {
        NLIBCErrSetHere(ERR_OUT_OF_MEMORY);
        return nullptr;
    }
    pHash->cbPool = static_cast<i32>(cbPool);
    pHash->cbFree = static_cast<i32>(cbPool);
    pHash->nSlot = static_cast<i32>(nSlot);
    pHash->pPoolNext = reinterpret_cast<char *>(Slots(pHash) + nSlot);
    return pHash;
}

// The slot that holds szKey, or the free one where it would go; -1 when the table is full of
// others.
int SlotFor(const NLIBHASH *pHash, const char *szKey)
{
    int index = NLIBCHashIndex(szKey, pHash->nSlot);
    for (int nTried = 0; nTried < pHash->nSlot; nTried++) {
        const char *const pszKey = Slots(pHash)[index].pszKey;
        if (pszKey == nullptr || strcmp(pszKey, szKey) == 0) {
            return index;
        }
        index = index + 1 == pHash->nSlot ? 0 : index + 1;
    }
    return -1;
}

char *PoolAppend(PNLIBHASH pHash, const char *szText)
{
    const size_t cbText = strlen(szText) + 1;
    char *const pszStored = pHash->pPoolNext;
    memcpy(pszStored, szText, cbText);
    pHash->pPoolNext += cbText;
    pHash->cbFree -= static_cast<i32>(cbText);
    return pszStored;
}

void PairStore(PNLIBHASH pHash, int index, const char *szKey, const char *szValue)
{
    NLIBHASH_SLOT &slot = Slots(pHash)[index];
    slot.pszKey = PoolAppend(pHash, szKey);
    slot.pszValue = PoolAppend(pHash, szValue);
    pHash->nEntry++;
}

// The same pairs in a larger table. Every pair fits, because neither size ever shrinks.
PNLIBHASH Rebuild(const NLIBHASH *pHash, i64 nSlot, i64 cbPool)
{
    NLIBHASH *const pNew = TableAlloc(nSlot, cbPool);
    if (pNew == nullptr) {
        return nullptr;
    }
    for (int i = 0; i < pHash->nSlot; i++) {
        const NLIBHASH_SLOT &slot = Slots(pHash)[i];
        if (slot.pszKey != nullptr) {
            PairStore(pNew, SlotFor(pNew, slot.pszKey), slot.pszKey, slot.pszValue);
        }
    }
    return pNew;
}

// A table with room for nNeeded bytes more and slots to spare: the same one, a rebuilt one, or
// NULL. Counts and sizes are those of the old table throughout.
PNLIBHASH MakeRoom(PNLIBHASH pHash, i64 nNeeded)
{
    const auto nFreeSlots = static_cast<float>(pHash->nSlot - pHash->nEntry);
    const float ratio = nFreeSlots / static_cast<float>(pHash->nSlot);
    const bool fCrowded = ratio < HASH_FREE_SLOT_RATIO_MIN;
    const bool fFits = nNeeded < pHash->cbFree;
    if (!fCrowded && fFits) {
        return pHash;
    }
    const i64 nSlot = fCrowded ? static_cast<i64>(pHash->nSlot) * 4 - 5 : pHash->nSlot;
    if (fFits) {
        return Rebuild(pHash, nSlot, pHash->cbPool);
    }
    const i64 cbPerEntry = pHash->nEntry == 0 ? nNeeded
                                              : static_cast<i64>(static_cast<float>(pHash->cbPool) /
                                                                 static_cast<float>(pHash->nEntry));
    const i64 nUnused = static_cast<i64>(pHash->nSlot) - pHash->nEntry;
    return Rebuild(pHash, nSlot, pHash->cbPool + cbPerEntry * nUnused + nNeeded);
}

} // namespace

PNLIBHASH NLIBCHashAllocator(int nSlot, int cbPool)
{
    if (nSlot < 0 || cbPool < 0) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return nullptr;
    }
    return TableAlloc(nSlot, cbPool);
}

PNLIBHASH NLIBCHashAlloc(int cbPool)
{
    return NLIBCHashAllocator(HASH_SLOTS_DEFAULT, std::max(cbPool, HASH_POOL_MIN));
}

void NLIBCHashFree(PNLIBHASH pHash)
{
    free(pHash);
}

int NLIBCHashSet(PNLIBHASH *ppHash, const char *szKey, const char *szValue)
{
    if (ppHash == nullptr || *ppHash == nullptr || szKey == nullptr || szValue == nullptr) {
        return -1;
    }
    NLIBHASH *const pOld = *ppHash;
    int index = SlotFor(pOld, szKey);
    if (index < 0) {
        return -1;
    }
    const bool fNewKey = Slots(pOld)[index].pszKey == nullptr;
    const size_t cbValue = strlen(szValue) + 1;
    if (!fNewKey && cbValue <= strlen(Slots(pOld)[index].pszValue) + 1) {
        memmove(Slots(pOld)[index].pszValue, szValue, cbValue);
        return index;
    }
    const size_t cbNeeded = cbValue + (fNewKey ? strlen(szKey) + 1 : 0);
    NLIBHASH *const pHash = MakeRoom(pOld, static_cast<i64>(cbNeeded));
    if (pHash == nullptr) {
        return -1;
    }
    index = pHash == pOld ? index : SlotFor(pHash, szKey);
    if (fNewKey) {
        PairStore(pHash, index, szKey, szValue);
    } else {
        Slots(pHash)[index].pszValue = PoolAppend(pHash, szValue);
    }
    if (pHash != pOld) {
        // Freed last: key and value may be texts of the old table.
        NLIBCHashFree(pOld);
    }
    *ppHash = pHash;
    return index;
}

const char *NLIBCHashGet(const NLIBHASH *pHash, const char *szKey)
{
    if (pHash == nullptr || szKey == nullptr) {
        return nullptr;
    }
    const int index = SlotFor(pHash, szKey);
    return index < 0 ? nullptr : Slots(pHash)[index].pszValue;
}

int NLIBCHashKeyListGet(const NLIBHASH *pHash, PNLIBSZLIST *ppList)
{
    if (pHash == nullptr) {
        return -1;
    }
    if (pHash->nEntry == 0) {
        return 0;
    }
    for (int i = 0; ppList != nullptr && i < pHash->nSlot; i++) {
        const char *const pszKey = Slots(pHash)[i].pszKey;
        if (pszKey != nullptr && NLIBCSzListPush(ppList, pszKey) < 0) {
            return -1;
        }
    }
    return pHash->nEntry;
}

int NLIBCHashIndex(const char *szText, int nSlot)
{
    if (szText == nullptr || nSlot <= 0) {
        return -1;
    }
    // The sum of the text's groups of four bytes, each read as a big-endian number by shifting, so
    // that every processor finds the same slot.
    u32 sum = 0;
    for (u32 i = 0; szText[i] != '\0'; i++) {
        sum += static_cast<u32>(static_cast<unsigned char>(szText[i])) << (24U - 8U * (i % 4U));
    }
    return static_cast<int>(sum % static_cast<u32>(nSlot));
}
