// SPDX-License-Identifier: MIT
#pragma once

// Trimming, splitting, appending and decimal numbers.

#include "nurocore/szlist_base.h"
#include "nurocore/types.h"

#include <cstddef>
#include <string_view>

// Copies szSrc without the white space around it (blank, tab, line feed, carriage return) and
// without one pair of enclosing double quotes to szDst, which has room for strlen(szSrc) + 1
// bytes; works in place when szDst is NULL or szSrc. Returns the length left, 0 or more; -1 with
// ERR_BAD_PARAMETER when szSrc is NULL or szDst points into it after its first byte.
int NLIBCStrTrimSpace(char *szSrc, char *szDst);

// The next field of *pszCursor that is not empty, split at any character of szDelims as strsep
// does. NULL when there is none or an argument is NULL. Sets no error.
char *NLIBCStrSepNonEmpty(char **pszCursor, const char *szDelims);

// Pushes every field of szText that is not empty onto the list. Returns how many, 0 for none, -1
// on failure: ERR_BAD_PARAMETER, ERR_OUT_OF_MEMORY, or the code of the push.
int NLIBCStrTok(const char *szText, const char *szDelims, PNLIBSZLIST *ppList);

// Appends szMore to szText, a terminated text in a buffer of cbText bytes, and cuts it where the
// buffer ends; the text stays terminated. Returns the length of the text then. A buffer of 0 bytes
// is neither read nor written.
size_t NLIBCStrAppend(char *szText, size_t cbText, const char *szMore);

// The same, but all of szMore or nothing. Returns 1 when it was appended, 0 when text and
// terminator do not fit: szText is then as it was.
int NLIBCStrAppendWhole(char *szText, size_t cbText, const char *szMore);

// szText after the prefix if it begins with it, else szText.
const char *NLIBCStrSkipPrefix(const char *szText, std::string_view prefix);

// The decimal number that szText begins with, as strtol reads it (white space, sign, then digits
// up to the first other character; 0 without digits), clamped to 32 bits on every platform.
i32 NLIBCStrToI32(const char *szText);
