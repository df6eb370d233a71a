// SPDX-License-Identifier: MIT
#pragma once

// The items of a list as one text.

#include "nurocore/szlist_base.h"

// Joins the items with szSeparator into the heap buffer *pszBuf of *pcbBuf bytes, which is
// enlarged as needed and stays the caller's. Returns the bytes needed: text, one more separator
// and the terminator. 0 for an empty list (buffer untouched); -1 on failure, and when it was for
// want of memory to enlarge it the buffer is gone and *pszBuf is NULL.
int NLIBCSzListJoin(const NLIBSZLIST *pList, const char *szSeparator, char **pszBuf, int *pcbBuf);

// Writes the items with szSeparator between them into szOut. Returns the length, 0 for an empty
// list, -1 with ERR_OUT_OF_SPACE when they do not fit (what fitted stays).
int NLIBCSzListDump2Str(const NLIBSZLIST *pList, const char *szSeparator, char *szOut, int cbOut);
