// SPDX-License-Identifier: MIT
#pragma once

// Files of key=value lines. A line that begins with '#' or ';' is a comment; white space around key
// and value is removed, and then one pair of enclosing double quotes.

constexpr int KEYVALUE_FIRST_MATCH = 0; // the first line that holds the key decides
constexpr int KEYVALUE_LAST_MATCH = 1;  // the last one does

// 1 when the line holds the key, 0 otherwise; NULL arguments give 0 with ERR_BAD_PARAMETER.
int NLIBCFileLineKeyMatch(const char *szLine, const char *szKey);

// Copies the value of szKey into szValue of cbValue bytes; with NULL and 0 it only measures.
// Returns the bytes needed, terminator included (so 1 is an empty value that was found); 0 with
// ERR_KEY_NOT_FOUND when no line gives the key a value; -1 with ERR_BAD_PARAMETER,
// ERR_OPEN_FAILED, or ERR_BUF_TOO_SMALL when the value does not fit (it is not copied then).
int NLIBCFileGetKeyValue(const char *szPath, const char *szKey, char *szValue, int cbValue,
                         int flags);

// 1 when the key's value equals szExpected without regard to case, 0 when not, defaultResult when
// the key is missing, 0 when the lookup fails (code of the lookup).
int NLIBCFileCheckKeyValue(const char *szPath, const char *szKey, const char *szExpected,
                           int defaultResult);
