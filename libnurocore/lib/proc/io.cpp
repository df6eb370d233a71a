// SPDX-License-Identifier: MIT
#include "nurocore/io.h"

#include "nurocore/error.h"

#include <cerrno>
#include <cstddef>
#include <cstdio>
#include <unistd.h>

namespace
{

constexpr int READ_ATTEMPTS = 3;

} // namespace

char *NLIBCFgets(char *szBuf, int cbBuf, FILE *pStream)
{
    if (szBuf == nullptr || cbBuf <= 0 || pStream == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return nullptr;
    }
    // Kept: "errno=%m" in a caller's log line after a failed read shows the errno from before it.
    const int errnoAtEntry = errno;
    char *pszRead = nullptr;
    for (int i = 0; i < READ_ATTEMPTS; i++) {
        errno = 0;
        pszRead = fgets(szBuf, cbBuf, pStream);
        if (pszRead != nullptr || errno != EINTR) {
            break;
        }
    }
    errno = errnoAtEntry;
    return pszRead;
}

ssize_t NLIBCRead(int fd, void *pBuf, size_t cbBuf)
{
    if (fd < 0 || pBuf == nullptr || cbBuf == 0) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    const int errnoAtEntry = errno;
    ssize_t cbRead = -1;
    for (int i = 0; i < READ_ATTEMPTS; i++) {
        errno = 0;
        cbRead = read(fd, pBuf, cbBuf);
        if (cbRead != -1 || errno != EINTR) {
            break;
        }
    }
    errno = errnoAtEntry;
    return cbRead;
}
