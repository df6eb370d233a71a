// SPDX-License-Identifier: MIT
#pragma once

// The items of a list as one text.

#include "nurocore/szlist_base.h"

// Joins the items with szSeparator into the heap buffer *pszBuf of *pcbBuf bytes, which is
// enlarged with realloc as needed and stays the caller's. Returns the bytes needed: the text, one
// more separator and the terminator; 0 for an empty list (buffer untouched); -1 on failure with
// ERR_BAD_PARAMETER or ERR_OUT_OF_MEMORY. When the buffer could not be enlarged it was freed, and
// *pszBuf is NULL.
//
//     int cbText = 1;
//     char *pszText = static_cast<char *>(malloc(1));
//     if (NLIBCSzListJoin(pList, ",", &pszText, &cbText) > 0) {
//         puts(pszText); // of the items a and b: "a,b"; 5 was returned
//     }
//     free(pszText);
int NLIBCSzListJoin(const NLIBSZLIST *pList, const char *szSeparator, char **pszBuf, int *pcbBuf);

// Writes the items with szSeparator between them into szOut. Returns the length of the text, 0 for
// an empty list; -1 with ERR_BAD_PARAMETER, or with ERR_OUT_OF_SPACE when the text and its
// terminator do not fit: szOut then holds the items before the one that does not.
int NLIBCSzListDump2Str(const NLIBSZLIST *pList, const char *szSeparator, char *szOut, int cbOut);
