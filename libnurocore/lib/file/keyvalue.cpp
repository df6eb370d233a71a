// SPDX-License-Identifier: MIT
#include "nurocore/keyvalue.h"

#include "nurocore/error.h"
#include "nurocore/handle.h"
#include "nurocore/log.h"
#include "nurocore/text.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <strings.h>

namespace
{

constexpr int CHECKED_VALUE_SIZE = 512;

// The state of a lookup. szValue is the caller's buffer until a line without a value makes the
// lookup forget it; cbNeeded is 0 until a value is found.
struct LOOKUP {
    char *szValue;
    int cbValue;
    int cbNeeded;
    bool fDone;
};

// The value of a line whose key has matched, trimmed in place; NULL when the line has none.
// "=" directly followed by the line's end is none, "=" and a blank is an empty value.
char *LineValue(char *szLine)
{
    char *pszCursor = szLine;
    (void)NLIBCStrSepNonEmpty(&pszCursor, "=");
    char *const pszValue = NLIBCStrSepNonEmpty(&pszCursor, "\n");
    if (pszValue != nullptr) {
        (void)NLIBCStrTrimSpace(pszValue, nullptr);
    }
    return pszValue;
}

void LookupTakeLine(LOOKUP &lookup, char *szLine, int flags)
{
    const char *const pszValue = LineValue(szLine);
    lookup.fDone = (flags & KEYVALUE_LAST_MATCH) == 0;
    if (pszValue == nullptr) {
        lookup.szValue = nullptr;
        return;
    }
    lookup.cbNeeded = static_cast<int>(strlen(pszValue)) + 1;
    if (lookup.szValue != nullptr && lookup.cbValue >= lookup.cbNeeded) {
        memcpy(lookup.szValue, pszValue, static_cast<size_t>(lookup.cbNeeded));
    }
}

int LookupResult(const LOOKUP &lookup)
{
    if (lookup.cbNeeded == 0) {
        NLIBCErrSetHere(ERR_KEY_NOT_FOUND);
        return 0;
    }
    if (lookup.szValue != nullptr && lookup.cbNeeded > lookup.cbValue) {
        NLIBCErrSetHere(ERR_BUF_TOO_SMALL);
        return -1;
    }
    return lookup.cbNeeded;
}

} // namespace

int NLIBCFileLineKeyMatch(const char *szLine, const char *szKey)
{
    if (szLine == nullptr || szKey == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return 0;
    }
    if (*szLine == '#' || *szLine == ';') {
        return 0;
    }
    const char *const pKey = szLine + strspn(szLine, "=");
    const HEAP_OWNER<char> szCopy(strndup(pKey, strcspn(pKey, "=")));
    if (szCopy == nullptr || *szCopy == '\0') {
        return 0;
    }
    (void)NLIBCStrTrimSpace(szCopy.get(), nullptr);
    return strcmp(szCopy.get(), szKey) == 0 ? 1 : 0;
}

int NLIBCFileGetKeyValue(const char *szPath, const char *szKey, char *szValue, int cbValue,
                         int flags)
{
    if (szPath == nullptr || szKey == nullptr || flags < 0 ||
        (szValue == nullptr && cbValue != 0)) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    const STREAM_OWNER pFile(fopen(szPath, "r"));
    if (pFile == nullptr) {
        NLIBCErrSetHere(ERR_OPEN_FAILED);
        return -1;
    }
    LOOKUP lookup = {.szValue = szValue, .cbValue = cbValue, .cbNeeded = 0, .fDone = false};
    char *pszLine = nullptr;
    size_t cbLine = 0;
    while (!lookup.fDone && getline(&pszLine, &cbLine, pFile.get()) >= 0) {
        if (NLIBCFileLineKeyMatch(pszLine, szKey) == 1) {
            LookupTakeLine(lookup, pszLine, flags);
        }
    }
    free(pszLine);
    return LookupResult(lookup);
}

int NLIBCFileCheckKeyValue(const char *szPath, const char *szKey, const char *szExpected,
                           int defaultResult)
{
    if (szPath == nullptr || szKey == nullptr || szExpected == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return 0;
    }
    char szValue[CHECKED_VALUE_SIZE];
    const int cbFound =
        NLIBCFileGetKeyValue(szPath, szKey, szValue, CHECKED_VALUE_SIZE, KEYVALUE_FIRST_MATCH);
    if (cbFound < 0) {
        NLIBCLog(LOG_DEBUG, "NLIBCFileGetKeyValue(%s) failed [0x%04X %s:%d]", szKey, NLIBCErrGet(),
                 NLIBCErrGetFile(), NLIBCErrGetLine());
        return 0;
    }
    if (cbFound == 0) {
        return defaultResult;
    }
    return strcasecmp(szValue, szExpected) == 0 ? 1 : 0;
}
