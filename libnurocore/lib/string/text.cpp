// SPDX-License-Identifier: MIT
#include "nurocore/text.h"

#include "nurocore/error.h"
#include "nurocore/handle.h"
#include "nurocore/szlist_base.h"
#include "nurocore/types.h"

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <string_view>

namespace
{

// Vertical tab and form feed count as text.
constexpr char WHITE_SPACE[] = " \t\n\r";

bool IsWhiteSpace(char ch)
{
    return ch != '\0' && strchr(WHITE_SPACE, ch) != nullptr;
}

bool IsBehindStartOf(const char *szText, size_t cchText, const char *pch)
{
    const auto start = reinterpret_cast<std::uintptr_t>(szText);
    const auto place = reinterpret_cast<std::uintptr_t>(pch);
    return place > start && place <= start + cchText;
}

// Not strnlen, which nothing else in the tool uses: each imported libc function is looked up every
// time the tool starts.
size_t LengthWithin(const char *szText, size_t cbText)
{
    return static_cast<size_t>(std::find(szText, szText + cbText, '\0') - szText);
}

} // namespace

int NLIBCStrTrimSpace(char *szSrc, char *szDst)
{
    if (szSrc == nullptr || IsBehindStartOf(szSrc, strlen(szSrc), szDst)) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    const char *pFirst = szSrc + strspn(szSrc, WHITE_SPACE);
    size_t cch = strlen(pFirst);
    while (cch > 0 && IsWhiteSpace(pFirst[cch - 1])) {
        cch--;
    }
    if (cch > 1 && pFirst[0] == '"' && pFirst[cch - 1] == '"') {
        pFirst++;
        cch -= 2;
    }
    char *const szTrimmed = szDst == nullptr ? szSrc : szDst;
    memmove(szTrimmed, pFirst, cch);
    szTrimmed[cch] = '\0';
    return static_cast<int>(cch);
}

char *NLIBCStrSepNonEmpty(char **pszCursor, const char *szDelims)
{
    if (pszCursor == nullptr || szDelims == nullptr) {
        return nullptr;
    }
    char *pszField = nullptr;
    do {
        pszField = strsep(pszCursor, szDelims);
    } while (pszField != nullptr && *pszField == '\0');
    return pszField;
}

int NLIBCStrTok(const char *szText, const char *szDelims, PNLIBSZLIST *ppList)
{
    if (szText == nullptr || szDelims == nullptr || ppList == nullptr || *ppList == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    const HEAP_OWNER<char> szCopy(strdup(szText));
    if (szCopy == nullptr) {
        NLIBCErrSetHere(ERR_OUT_OF_MEMORY);
        return -1;
    }
    int nField = 0;
    char *pszCursor = szCopy.get();
    while (const char *const pszField = NLIBCStrSepNonEmpty(&pszCursor, szDelims)) {
        if (NLIBCSzListPush(ppList, pszField) < 0) {
            return -1;
        }
        nField++;
    }
    return nField;
}

size_t NLIBCStrAppend(char *szText, size_t cbText, const char *szMore)
{
    const size_t cchText = LengthWithin(szText, cbText);
    if (cchText == cbText) {
        return cchText;
    }
    const size_t cchMore = std::min(strlen(szMore), cbText - cchText - 1);
    memcpy(szText + cchText, szMore, cchMore);
    szText[cchText + cchMore] = '\0';
    return cchText + cchMore;
}

int NLIBCStrAppendWhole(char *szText, size_t cbText, const char *szMore)
{
    if (strlen(szMore) >= cbText - LengthWithin(szText, cbText)) {
        return 0;
    }
    (void)NLIBCStrAppend(szText, cbText, szMore);
    return 1;
}

const char *NLIBCStrSkipPrefix(const char *szText, std::string_view prefix)
{
    return std::string_view(szText).starts_with(prefix) ? szText + prefix.size() : szText;
}

i32 NLIBCStrToI32(const char *szText)
{
    const i64 value = strtol(szText, nullptr, 10);
    return static_cast<i32>(
        std::clamp<i64>(value, std::numeric_limits<i32>::min(), std::numeric_limits<i32>::max()));
}
