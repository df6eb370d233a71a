// SPDX-License-Identifier: MIT
#pragma once

#include "nurocore/szlist_base.h"

// Creates an empty file unless a regular file is there already, which is never opened. Returns 0
// when one is there afterwards, else -1 (ERR_BAD_PARAMETER for NULL, no code otherwise).
int NLIBCFileTouch(const char *szPath);

// 1 for a regular file, 0 for everything else, NULL included.
int NLIBCFileExist(const char *szPath);

// Appends every line of the file, its line end included, to the list. A line of 1024 bytes or more
// comes in pieces of at most 1023. Returns 0 when the file was read to its end; -1 with
// ERR_BAD_PARAMETER, ERR_OPEN_FAILED or the code of the push; lines read so far stay in the list.
int NLIBCFileReadLines(const char *szPath, PNLIBSZLIST *ppList);
