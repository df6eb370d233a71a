// SPDX-License-Identifier: MIT
#pragma once

// What a call leaves in the last-error record.

#include "nurocore/error.h"

#include <cerrno>
#include <gtest/gtest.h>

// Stands in the record before a call, so that it shows whether the call wrote it; no failure has
// it.
inline constexpr u32 OLD_CODE = 0xFFFFFF00;

// And no errno of an earlier call, whose words would get into the log.
inline void RecordReset()
{
    NLIBCErrSet(OLD_CODE, "before", 1);
    errno = 0;
}

// The call returns result and leaves code in the record.
#define EXPECT_FAILS(call, result, code)                                                           \
    do {                                                                                           \
        RecordReset();                                                                             \
        EXPECT_EQ(call, result);                                                                   \
        EXPECT_EQ(NLIBCErrGet(), u32{code}) << #call;                                              \
    } while (false)

// The call returns result and does not touch the record.
#define EXPECT_QUIET(call, result) EXPECT_FAILS(call, result, OLD_CODE)
