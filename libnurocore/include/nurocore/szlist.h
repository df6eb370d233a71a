// SPDX-License-Identifier: MIT
#pragma once

// A growable list of strings that lives in one heap block: header, slots and bytes together.
//
// The list owns copies of its strings. A function that may grow the list takes the address of the
// caller's pointer, because growing moves the block; strings handed out stay valid until then.
// Every failure leaves the list as it was and sets the last-error record: ERR_BAD_PARAMETER for
// arguments, ERR_OUT_OF_MEMORY when the block cannot grow.

#include "nurocore/types.h"

#include <memory>

struct NLIBSZLIST {
    i32 nSize;     // bytes of the whole block
    i32 nItem;     // slots in use
    i32 nFree;     // bytes between the last slot and the lowest string byte
    i32 fMode;     // one of SZLIST_*
    i32 EndofFree; // offset of the lowest string byte; strings grow downward from the block's end
    i32 pszEmpty;  // offset of the block's last byte, always 0: what a skipped slot points at
};

using PNLIBSZLIST = NLIBSZLIST *;

static_assert(sizeof(NLIBSZLIST) == 24, "every size of a list counts on six 32-bit words");

constexpr int SZLIST_UNSORTED = 0;
constexpr int SZLIST_SORTED = 1;       // kept in byte order
constexpr int SZLIST_CASE_SORTED = 16; // kept in order without regard to case

constexpr int SZLIST_OR_NEW = 4096; // NLIBCSzListOr: leave both lists alone, make a new one

// A list of nSize bytes, 512 at least. The caller frees it with NLIBCSzListFree. NULL on failure.
PNLIBSZLIST NLIBCSzListAlloc(int nSize);

// NULL is ignored.
void NLIBCSzListFree(PNLIBSZLIST pList);

// Frees a list at the end of a scope. It holds the address of the pointer, because a list that
// grows moves.
struct LIST_DELETER {
    void operator()(PNLIBSZLIST *ppList) const
    {
        NLIBCSzListFree(*ppList);
    }
};

using LIST_OWNER = std::unique_ptr<PNLIBSZLIST, LIST_DELETER>;

// Stores a copy of szItem at index; slots between the end and index are left empty. A sorted list
// ignores index and chooses the place itself. Returns the index used, -1 on failure.
int NLIBCSzListInsert(PNLIBSZLIST *ppList, int index, const char *szItem);

// Appends, or inserts at slot 0. Return as NLIBCSzListInsert.
int NLIBCSzListPush(PNLIBSZLIST *ppList, const char *szItem);
int NLIBCSzListPushHead(PNLIBSZLIST *ppList, const char *szItem);

// The string at index; it belongs to the list. NULL with ERR_BAD_PARAMETER outside the list.
const char *NLIBCSzListGet(const NLIBSZLIST *pList, int index);

// The index of an item that equals szItem, -1 when there is none (no error is set) or on failure.
// Find refuses a list sorted without case, CaseFind one sorted by bytes (ERR_BAD_PARAMETER).
int NLIBCSzListFind(const NLIBSZLIST *pList, const char *szItem);
int NLIBCSzListCaseFind(const NLIBSZLIST *pList, const char *szItem);

// Takes the slot out and returns its string, whose bytes stay in the block until it next grows.
// NULL with ERR_BAD_PARAMETER outside the list.
const char *NLIBCSzListRemove(PNLIBSZLIST pList, int index);

// Replaces the string at index. The list never grows here: a string longer than the old one needs
// its length + 1 bytes of nFree, and that is the caller's to know. Returns index, or the place
// that NLIBCSzListFind tells in a sorted list; -1 on failure.
int NLIBCSzListSet(PNLIBSZLIST *ppList, int index, const char *szItem);

// Puts the list into fMode. Only an unsorted list is compacted and sorted; from one sorted mode to
// another just the mode changes. NULL is ignored.
void NLIBCSzListSort(PNLIBSZLIST pList, int fMode);

// Drops the empty slots. NULL gives ERR_BAD_PARAMETER.
void NLIBCSzListCompact(PNLIBSZLIST pList);

// Drops all items; block size and mode stay. NULL gives ERR_BAD_PARAMETER.
void NLIBCSzListClear(PNLIBSZLIST pList);

// Moves the list into a block of twice the size and frees the old one. Returns the new block, or
// NULL (the old list is untouched).
PNLIBSZLIST NLIBCSzListExpand(PNLIBSZLIST pList);

// Joins the items with szSeparator into the heap buffer *pszBuf of *pcbBuf bytes, which is
// enlarged as needed and stays the caller's. Returns the bytes needed: text, one more separator
// and the terminator. 0 for an empty list (buffer untouched); -1 on failure, and when it was for
// want of memory to enlarge it the buffer is gone and *pszBuf is NULL.
int NLIBCSzListJoin(const NLIBSZLIST *pList, const char *szSeparator, char **pszBuf, int *pcbBuf);

// Writes the items with szSeparator between them into szOut. Returns the length, 0 for an empty
// list, -1 with ERR_OUT_OF_SPACE when they do not fit (what fitted stays).
int NLIBCSzListDump2Str(const NLIBSZLIST *pList, const char *szSeparator, char *szOut, int cbOut);

// Merges pOther into the list, or both into a new list with SZLIST_OR_NEW (the caller frees it).
// Returns the result, NULL on failure: ERR_BAD_PARAMETER for lists whose modes do not go together.
// A list in place then holds what was merged so far, unsorted.
PNLIBSZLIST NLIBCSzListOr(PNLIBSZLIST *ppList, const NLIBSZLIST *pOther, int flags);

// Prints the list with its addresses on standard output. Returns what the last printf returned.
int NLIBCSzListDump(const NLIBSZLIST *pList);
