// SPDX-License-Identifier: MIT
#pragma once

// Reading that carries on after an interruption by a signal. errno is restored to its value at the
// call.

#include <cstdio>
#include <sys/types.h>

// fgets, with up to three attempts when it is interrupted. Returns NULL at the end of the stream,
// on failure, and for bad arguments (ERR_BAD_PARAMETER).
char *NLIBCFgets(char *szBuf, int cbBuf, FILE *pStream);

// read, with up to three attempts when it is interrupted. Returns the bytes read, 0 at the end, -1
// on failure; -1 with ERR_BAD_PARAMETER for bad arguments, among them a size of 0.
ssize_t NLIBCRead(int fd, void *pBuf, size_t cbBuf);
