// SPDX-License-Identifier: MIT
#include "nurocore/error.h"

#include "nurocore/types.h"

namespace
{

struct LAST_ERROR {
    u32 code;
    const char *szFile;
    int line;
};

LAST_ERROR g_lastError = {};

} // namespace

void NLIBCErrSet(u32 code, const char *szFile, int line)
{
    g_lastError = {.code = code, .szFile = szFile, .line = line};
}

u32 NLIBCErrGet()
{
    return g_lastError.code;
}

const char *NLIBCErrGetFile()
{
    return g_lastError.szFile;
}

int NLIBCErrGetLine()
{
    return g_lastError.line;
}
