// SPDX-License-Identifier: MIT
#include "nurocore/szlist_join.h"

#include "nurocore/error.h"
#include "nurocore/handle.h"
#include "nurocore/log.h"
#include "nurocore/szlist_base.h"
#include "nurocore/text.h"
#include "nurocore/types.h"
#include "szlist_internal.h"

#include <climits>
#include <cstdlib>
#include <cstring>

namespace
{

// Enlarges the caller's buffer to cbNeeded bytes. Without memory it is freed and set to NULL.
bool JoinBufferEnlarge(char **pszBuf, int *pcbBuf, i64 cbNeeded)
{
    if (cbNeeded <= *pcbBuf) {
        return true;
    }
    void *const pNew =
        cbNeeded > INT_MAX ? nullptr : realloc(*pszBuf, static_cast<size_t>(cbNeeded));
    if (pNew == nullptr) {
        free(*pszBuf);
        *pszBuf = nullptr;
        return false;
    }
    *pszBuf = static_cast<char *>(pNew);
    *pcbBuf = static_cast<int>(cbNeeded);
    return true;
}

int JoinFailOutOfMemory()
{
    NLIBCErrSetHere(ERR_OUT_OF_MEMORY);
    NLIBCLog(LOG_ERR, "Out of memory!!");
    return -1;
}

} // namespace

int NLIBCSzListJoin(const NLIBSZLIST *pList, const char *szSeparator, char **pszBuf, int *pcbBuf)
{
    if (pList == nullptr || szSeparator == nullptr || pszBuf == nullptr || *pszBuf == nullptr ||
        pcbBuf == nullptr || *pcbBuf < 0) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        NLIBCLog(LOG_ERR, "Parameter error");
        return -1;
    }
    if (pList->nItem == 0) {
        return 0;
    }
    const size_t cchSeparator = strlen(szSeparator);
    const HEAP_OWNER<size_t> pUnits(
        static_cast<size_t *>(calloc(static_cast<size_t>(pList->nItem), sizeof(size_t))));
    if (pUnits == nullptr) {
        return JoinFailOutOfMemory();
    }
    i64 cbNeeded = 1;
    for (i32 i = 0; i < pList->nItem; i++) {
        pUnits.get()[i] = strlen(SzListItem(pList, i)) + cchSeparator;
        cbNeeded += static_cast<i64>(pUnits.get()[i]);
    }
    if (!JoinBufferEnlarge(pszBuf, pcbBuf, cbNeeded)) {
        return JoinFailOutOfMemory();
    }
    memset(*pszBuf, 0, static_cast<size_t>(*pcbBuf));
    char *pszNext = *pszBuf;
    for (i32 i = 0; i < pList->nItem; i++) {
        const size_t cchItem = pUnits.get()[i] - cchSeparator;
        memcpy(pszNext, SzListItem(pList, i), cchItem);
        memcpy(pszNext + cchItem, szSeparator, cchSeparator);
        pszNext += pUnits.get()[i];
    }
    *(pszNext - cchSeparator) = '\0';
    return static_cast<int>(cbNeeded);
}

int NLIBCSzListDump2Str(const NLIBSZLIST *pList, const char *szSeparator, char *szOut, int cbOut)
{
    if (pList == nullptr || szSeparator == nullptr || szOut == nullptr || cbOut < 1) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        NLIBCLog(LOG_ERR, "Parameter error");
        return -1;
    }
    const auto cbOutTotal = static_cast<size_t>(cbOut);
    memset(szOut, 0, cbOutTotal);
    size_t cchOut = 0;
    for (i32 i = 0; i < pList->nItem; i++) {
        const char *const szLead = i == 0 ? "" : szSeparator;
        const size_t cchUnit = strlen(szLead) + strlen(SzListItem(pList, i));
        if (cchOut + cchUnit >= cbOutTotal) {
            NLIBCErrSetHere(ERR_OUT_OF_SPACE);
            return -1;
        }
        cchOut += NLIBCStrAppend(szOut + cchOut, cbOutTotal - cchOut, szLead);
        cchOut += NLIBCStrAppend(szOut + cchOut, cbOutTotal - cchOut, SzListItem(pList, i));
    }
    return static_cast<int>(cchOut);
}
