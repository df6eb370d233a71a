// SPDX-License-Identifier: MIT
#include "nurocore/file.h"

#include "nurocore/error.h"
#include "nurocore/handle.h"
#include "nurocore/io.h"
#include "nurocore/log.h"
#include "nurocore/szlist_base.h"

#include <cstdio>
#include <sys/stat.h>

namespace
{

constexpr int LINE_SIZE = 1024;

} // namespace

int NLIBCFileTouch(const char *szPath)
{
    if (szPath == nullptr) {
        NLIBCLog(LOG_ERR, "Bad parameters");
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    if (NLIBCFileExist(szPath) == 1) {
        return 0;
    }
    const STREAM_OWNER pFile(fopen(szPath, "w"));
    if (pFile == nullptr) {
        // Kept: the words say the opposite of what happened, but log readers search for them.
        NLIBCLog(LOG_ERR, "file exist: %s, errno=%m", szPath);
        return -1;
    }
    return 0;
}

int NLIBCFileExist(const char *szPath)
{
    struct stat status = {};
    return szPath != nullptr && stat(szPath, &status) == 0 && S_ISREG(status.st_mode) ? 1 : 0;
}

int NLIBCFileReadLines(const char *szPath, PNLIBSZLIST *ppList)
{
    if (szPath == nullptr || ppList == nullptr || *ppList == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    const STREAM_OWNER pFile(fopen(szPath, "r"));
    if (pFile == nullptr) {
        NLIBCErrSetHere(ERR_OPEN_FAILED);
        return -1;
    }
    char szLine[LINE_SIZE];
    while (NLIBCFgets(szLine, LINE_SIZE, pFile.get()) != nullptr) {
        if (NLIBCSzListPush(ppList, szLine) < 0) {
            return -1;
        }
    }
    return feof(pFile.get()) != 0 ? 0 : -1;
}
