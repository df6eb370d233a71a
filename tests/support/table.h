// SPDX-License-Identifier: MIT
#pragma once

// Tests of one shape: each row of a table is a test of its own, called by the row's szName. The
// body behind it finds the row by GetParam().

#include <gtest/gtest.h>
#include <iterator>
#include <ostream>
#include <type_traits>
#include <vector>

// Shown by its name; byte by byte it would show what lies between the fields, too.
template <typename ROW>
struct TABLE_ROW {
    const ROW *pRow;
};

template <typename ROW>
void PrintTo(const TABLE_ROW<ROW> &row, std::ostream *pOut)
{
    *pOut << row.pRow->szName;
}

template <typename TABLE>
auto TableRows(const TABLE &rows)
{
    std::vector<TABLE_ROW<std::remove_cvref_t<decltype(*std::begin(rows))>>> all;
    for (const auto &row : rows) {
        all.push_back({&row});
    }
    return all;
}

template <typename ROW>
struct TABLE_TEST : testing::TestWithParam<TABLE_ROW<ROW>> {
    static const ROW &GetParam()
    {
        return *testing::TestWithParam<TABLE_ROW<ROW>>::GetParam().pRow;
    }
};

#define TEST_ROWS(Suite, rows)                                                                     \
    struct Suite : TABLE_TEST<std::remove_cvref_t<decltype(*std::begin(rows))>> {                  \
    };                                                                                             \
    INSTANTIATE_TEST_SUITE_P(Table, Suite, testing::ValuesIn(TableRows(rows)),                     \
                             [](const auto &row) { return row.param.pRow->szName; });              \
    TEST_P(Suite, Row)
