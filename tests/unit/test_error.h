// SPDX-License-Identifier: MIT
#pragma once

// What a call leaves in the last-error record.

#include "nurocore/error.h"

#include <gtest/gtest.h>

// No failure sets it: the low byte of a code is 0.
constexpr u32 ERROR_MARK = 0x0D0D;

inline void ErrorMark()
{
    NLIBCErrSet(ERROR_MARK, "mark", 1);
}

// The call returns result and leaves code in the record.
#define EXPECT_FAILS(call, result, code)                                                           \
    do {                                                                                           \
        ErrorMark();                                                                               \
        EXPECT_EQ(call, result);                                                                   \
        EXPECT_EQ(NLIBCErrGet(), u32{code}) << #call;                                              \
    } while (false)

// The call returns result and does not touch the record.
#define EXPECT_QUIET(call, result) EXPECT_FAILS(call, result, ERROR_MARK)
