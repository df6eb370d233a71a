// SPDX-License-Identifier: MIT
#pragma once

#include "nurocore/szlist_base.h"

// Creates an empty file unless szPath is a regular file already; an existing one is not opened, so
// it is never truncated. Returns 0 when the file exists afterwards, else -1 (ERR_BAD_PARAMETER for
// NULL, no code otherwise).
int NLIBCFileTouch(const char *szPath);

// 1 for a regular file, 0 for anything else, including NULL.
int NLIBCFileExist(const char *szPath);

// Appends every line of the file, its line end included, to the list. A line of 1024 bytes or more
// is split into pieces of at most 1023 bytes. Returns 0 when the file was read to its end; -1 with
// ERR_BAD_PARAMETER, ERR_OPEN_FAILED or the code of the push; lines read so far stay in the list.
int NLIBCFileReadLines(const char *szPath, PNLIBSZLIST *ppList);
