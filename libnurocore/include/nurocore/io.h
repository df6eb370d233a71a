// SPDX-License-Identifier: MIT
#pragma once

// Reading that is not put off by an interruption. errno is given back as it was at the call.

#include <cstdio>
#include <sys/types.h>

// fgets, tried up to three times while it is interrupted. NULL at the end of the stream, on
// failure, and with ERR_BAD_PARAMETER for bad arguments.
char *NLIBCFgets(char *szBuf, int cbBuf, FILE *pStream);

// read, tried up to three times while it is interrupted. Bytes read, 0 at the end, -1 on failure,
// with ERR_BAD_PARAMETER for bad arguments (0 bytes are one).
ssize_t NLIBCRead(int fd, void *pBuf, size_t cbBuf);
