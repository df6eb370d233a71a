// SPDX-License-Identifier: MIT
#pragma once

// What stands in the last-error record before a call, so that it shows whether the call wrote it.

#include "nurocore/error.h"

inline constexpr u32 OLD_CODE = 0xFFFFFF00;

inline void RecordReset()
{
    NLIBCErrSet(OLD_CODE, "before", 1);
}
