// SPDX-License-Identifier: MIT
#pragma once

// A string-to-string map in one heap block: header, open-addressing slots and a pool of texts.
// Only NLIBCHashSet may move the block; it then updates the caller's pointer.

#include "nurocore/szlist_base.h"
#include "nurocore/types.h"

#include <memory>

struct NLIBHASH_SLOT {
    char *pszKey; // both NULL in a free slot, both inside the pool in a used one
    char *pszValue;
};

struct NLIBHASH {
    i32 cbPool;      // bytes of the pool
    i32 cbFree;      // bytes of the pool not used yet
    i32 nSlot;       // slots
    i32 nEntry;      // keys stored
    char *pPoolNext; // first byte of the pool not used yet
};

static_assert(sizeof(NLIBHASH) == 4 * sizeof(i32) + sizeof(char *));

using PNLIBHASH = NLIBHASH *;

// An empty table of nSlot slots and cbPool bytes for texts. One without slots takes no key. The
// caller frees it with NLIBCHashFree. NULL on failure: ERR_BAD_PARAMETER for a negative number,
// ERR_OUT_OF_MEMORY when there is no memory for it.
PNLIBHASH NLIBCHashAllocator(int nSlot, int cbPool);

// The same with 31 slots and a pool of at least 512 bytes, whatever cbPool is.
PNLIBHASH NLIBCHashAlloc(int cbPool);

// NULL is ignored.
void NLIBCHashFree(PNLIBHASH pHash);

// Frees a table at the end of a scope. It holds the address of the pointer, because a table that
// grows moves.
struct HASH_DELETER {
    void operator()(PNLIBHASH *ppHash) const
    {
        NLIBCHashFree(*ppHash);
    }
};

using HASH_OWNER = std::unique_ptr<PNLIBHASH, HASH_DELETER>;

// Stores copies of the pair, or replaces the key's value. Returns the slot of the key (0 or more);
// -1 for NULL arguments, a full table (both without a code), or no memory to grow
// (ERR_OUT_OF_MEMORY): the table then stays as it was.
int NLIBCHashSet(PNLIBHASH *ppHash, const char *szKey, const char *szValue);

// The key's value; it belongs to the table. NULL when there is none.
const char *NLIBCHashGet(const NLIBHASH *pHash, const char *szKey);

// Appends every key to *ppList in slot order (ppList may be NULL). Returns the number of keys, -1
// for a NULL table or when the list cannot grow.
int NLIBCHashKeyListGet(const NLIBHASH *pHash, PNLIBSZLIST *ppList);

// The slot where the search for a text begins: 0 to nSlot - 1; -1 for NULL or no slots. It is the
// same on every processor, and so is the order of a key list.
int NLIBCHashIndex(const char *szText, int nSlot);
