// SPDX-License-Identifier: MIT
#pragma once

// What stands in the last-error record before a call, so that it shows whether the call wrote it;
// and no errno of an earlier call, whose words would get into the log.

#include "nurocore/error.h"

#include <cerrno>

inline constexpr u32 OLD_CODE = 0xFFFFFF00;

inline void RecordReset()
{
    NLIBCErrSet(OLD_CODE, "before", 1);
    errno = 0;
}
