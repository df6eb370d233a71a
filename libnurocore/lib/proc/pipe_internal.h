// SPDX-License-Identifier: MIT
#pragma once

// The lock of the registry of streams. The tool has one thread and never waits for it; it is there
// for programs with several threads.

#include "nurocore/types.h"

// Returns how many attempts found it held.
u32 PipeStreamsLock();

void PipeStreamsUnlock();
