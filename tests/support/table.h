// SPDX-License-Identifier: MIT
#pragma once

// Tests of one shape: each row of a table is a test of its own, called by the row's szName. The
// body behind it finds the row by GetParam().

#include <gtest/gtest.h>
#include <iterator>
#include <type_traits>

#define TEST_ROWS(Suite, rows)                                                                     \
    struct Suite : testing::TestWithParam<std::remove_cvref_t<decltype(*std::begin(rows))>> {      \
    };                                                                                             \
    INSTANTIATE_TEST_SUITE_P(Table, Suite, testing::ValuesIn(rows),                                \
                             [](const auto &row) { return row.param.szName; });                    \
    TEST_P(Suite, Row)
