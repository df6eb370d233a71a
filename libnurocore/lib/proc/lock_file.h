// SPDX-License-Identifier: MIT
#pragma once

// The appliance's lock files, and which of them this process holds. No command of the tool takes
// one; a child releases those that its parent may hold.

#include "nurocore/types.h"

#include <cstdio>

struct LOCK_FILE {
    FILE *pStream; // open while the lock is held
    const char *szPath;
    u32 lockBit; // 0 ends the table
    i32 nHold;
    i32 reserved;
};

// The table's first row; the row with lockBit 0 ends it.
LOCK_FILE *NLIBCLockFileTable();

// Closes every open lock file and clears every hold count. Returns 0, or -1 when one could not be
// closed.
int NLIBCLockFilesRelease();
