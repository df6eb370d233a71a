// SPDX-License-Identifier: MIT
#pragma once

// A growable list of strings that lives in one heap block: header, slots and bytes together.
//
// The list owns copies of its strings. A function that may grow the list takes the address of the
// caller's pointer, because growing moves the block; strings handed out stay valid until then.
// A failure sets the last-error record: ERR_BAD_PARAMETER for arguments, ERR_OUT_OF_MEMORY when the
// block cannot grow. It leaves the items as they were, but an insertion that has doubled the block
// once and cannot do it again leaves the larger block in the caller's pointer.
//
// A slot that was skipped holds no item: Find passes it and Compact drops it. So does a slot whose
// empty string ends in the last byte of the block, because an empty slot is told by that address:
// an empty string that is the first one stored in a fresh or cleared list, and, as soon as the
// block grows, one that has no other string in a slot before it.

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

// Replaces the string at index. The list never grows here, and room is not checked: a string longer
// than the old one needs length + 1 bytes of nFree, which the caller must check, or it overwrites
// slots. Returns index, or in a sorted list what NLIBCSzListFind returns for
// the string; -1 on failure, and always with SZLIST_CASE_SORTED (ERR_BAD_PARAMETER, although the
// string was replaced).
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

// Prints the list with its addresses on standard output. Returns what the last printf returned.
int NLIBCSzListDump(const NLIBSZLIST *pList);
