// SPDX-License-Identifier: MIT
//
// Texts made of a string list, and lists made of two.
#include "nurocore/szlist.h"

#include "last_error.h"
#include "table.h"
#include "test_szlist.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <string_view>

namespace
{

using std::literals::operator""sv;

// A heap buffer that a join may enlarge.
struct JOIN_BUFFER {
    char *psz;
    int cb;

    explicit JOIN_BUFFER(int cbIn)
        : psz(static_cast<char *>(malloc(cbIn > 0 ? static_cast<size_t>(cbIn) : 1))), cb(cbIn)
    {
        memset(psz, '#', cbIn > 0 ? static_cast<size_t>(cbIn) : 1);
    }
    JOIN_BUFFER(const JOIN_BUFFER &) = delete;
    JOIN_BUFFER &operator=(const JOIN_BUFFER &) = delete;
    ~JOIN_BUFFER()
    {
        free(psz);
    }
};

struct JOIN_CASE {
    const char *szName;
    ITEMS items;
    const char *szSeparator;
    int cb; // of the buffer, full of '#'
    int result;
    int cbAfter;
    std::string_view bytes; // the buffer begins with afterwards
};

const JOIN_CASE JOIN_CASES[] = {
    // Two units of one item and one separator each, and the terminator: 5.
    {"EnlargesABufferOfNoBytes", {"a", "b"}, ",", 0, 5, 5, "a,b\0"sv},
    {"EnlargesABufferThatIsTooSmall", {"a", "b"}, ",", 4, 5, 5, "a,b\0"sv},
    {"KeepsABufferOfTheVerySize", {"a", "b"}, ",", 5, 5, 5, "a,b\0"sv},
    {"KeepsALargerBufferAndClearsTheRest", {"a", "b"}, ",", 9, 5, 9, "a,b\0\0\0\0\0\0"sv},
    {"CountsALongSeparatorOncePerItem", // 3 * (4 + 6) + 1
     {"sda1", "sdb1", "sdc1"},
     " /dev/",
     0,
     31,
     31,
     "sda1 /dev/sdb1 /dev/sdc1\0"sv},
    {"NeedsNoSeparator", {"sda1", "sdb1", "sdc1"}, "", 0, 13, 13, "sda1sdb1sdc1\0"sv},
    {"LeavesTheBufferToAnEmptyList", {}, ",", 3, 0, 3, "###"sv},
};

TEST_ROWS(SzListJoin, JOIN_CASES)
{
    const JOIN_CASE &row = GetParam();
    const TEST_LIST list(row.items, SZLIST_UNSORTED);
    JOIN_BUFFER buffer(row.cb);
    EXPECT_QUIET(NLIBCSzListJoin(list.p, row.szSeparator, &buffer.psz, &buffer.cb), row.result);
    ASSERT_EQ(buffer.cb, row.cbAfter);
    EXPECT_EQ(std::string_view(buffer.psz, row.bytes.size()), row.bytes);
}

TEST(SzListJoinEmptySlots, JoinsEmptySlotsAsEmptyTexts)
{
    TEST_LIST list({"a"}, SZLIST_UNSORTED);
    ASSERT_EQ(NLIBCSzListInsert(&list.p, 2, "b"), 2);
    JOIN_BUFFER buffer(0);
    EXPECT_QUIET(NLIBCSzListJoin(list.p, ",", &buffer.psz, &buffer.cb), 6);
    EXPECT_STREQ(buffer.psz, "a,,b");
}

// 16 bytes, all of them '#' before.
struct DUMP_CASE {
    const char *szName;
    ITEMS items;
    const char *szSeparator;
    int cbOut; // that the callee is told of
    int result;
    std::string_view bytes;
};

const DUMP_CASE DUMP_CASES[] = {
    {"All", {"ab", "cd"}, ",", 16, 5, "ab,cd\0\0\0\0\0\0\0\0\0\0\0"sv},
    {"WhatJustFits", {"ab", "cd"}, ",", 6, 5, "ab,cd\0##########"sv},
    {"WithoutSeparator", {"ab", "cd"}, "", 5, 4, "abcd\0###########"sv},
    {"ALongSeparator", {"ab", "cd"}, " and ", 16, 9, "ab and cd\0\0\0\0\0\0\0"sv},
    {"OneItem", {"ab"}, ",", 7, 2, "ab\0\0\0\0\0#########"sv},
    {"NoItem", {}, ",", 7, 0, "\0\0\0\0\0\0\0#########"sv},
    // up to the unit that does not fit
    {"OneByteShort", {"ab", "cd"}, ",", 5, -1, "ab\0\0\0###########"sv},
    {"OneItemOfTwo", {"ab", "cd"}, ",", 3, -1, "ab\0#############"sv},
    {"NotEvenOneItem", {"ab", "cd"}, ",", 2, -1, "\0\0##############"sv},
    {"NothingButTheEnd", {"ab", "cd"}, ",", 1, -1, "\0###############"sv},
    {"ALongItem", {"ab", "cdefg"}, ",", 7, -1, "ab\0\0\0\0\0#########"sv},
};

TEST_ROWS(SzListDump2Str, DUMP_CASES)
{
    const DUMP_CASE &row = GetParam();
    const TEST_LIST list(row.items, SZLIST_UNSORTED);
    std::string out(16, '#');
    EXPECT_FAILS(NLIBCSzListDump2Str(list.p, row.szSeparator, out.data(), row.cbOut), row.result,
                 row.result == -1 ? ERR_OUT_OF_SPACE : OLD_CODE);
    EXPECT_EQ(out, row.bytes);
}

constexpr int IN_PLACE = 0;
constexpr int IN_PLACE_KEEP = 1; // neither 0 nor the flag of a new list

struct ORDERED {
    ITEMS items;
    int fMode;
};

ORDERED Unsorted(const ITEMS &items)
{
    return {items, SZLIST_UNSORTED};
}

ORDERED Bytes(const ITEMS &items)
{
    return {items, SZLIST_SORTED};
}

ORDERED NoCase(const ITEMS &items)
{
    return {items, SZLIST_CASE_SORTED};
}

struct OR_CASE {
    const char *szName;
    ORDERED a;
    ORDERED b;
    int flags;
    ORDERED expected;
};

const OR_CASE OR_CASES[] = {
    // unsorted with sorted: B's items, and what only A holds
    {"InPlaceCopiesOfARemoved", Unsorted({"c", "x", "b"}), Bytes({"b", "c"}), IN_PLACE,
     Unsorted({"x", "b", "c"})},
    {"InPlaceCopiesOfAKept", Unsorted({"c", "x", "b"}), Bytes({"b", "c"}), IN_PLACE_KEEP,
     Unsorted({"c", "x", "b", "b", "c"})},
    {"New", Unsorted({"c", "x", "b"}), Bytes({"b", "c"}), SZLIST_OR_NEW, Unsorted({"b", "c", "x"})},
    {"EveryCopyOfARemoved", Unsorted({"b", "b", "x"}), Bytes({"b"}), IN_PLACE,
     Unsorted({"x", "b"})},
    {"ByBytesCaseTellsApart", Unsorted({"B", "x"}), Bytes({"b"}), IN_PLACE,
     Unsorted({"B", "x", "b"})},
    {"WithoutCaseInPlace", Unsorted({"B", "x"}), NoCase({"b"}), IN_PLACE, Unsorted({"x", "b"})},
    {"WithoutCaseNew", Unsorted({"B", "x"}), NoCase({"b"}), SZLIST_OR_NEW, Unsorted({"b", "x"})},
    {"AWithoutItems", Unsorted({}), Bytes({"b", "c"}), IN_PLACE, Unsorted({"b", "c"})},
    {"BWithoutItems", Unsorted({"a"}), Bytes({}), IN_PLACE, Unsorted({"a"})},
    {"BWithoutItemsNew", Unsorted({"b", "a"}), Bytes({}), SZLIST_OR_NEW, Unsorted({"b", "a"})},
    // both unsorted
    {"UnsortedInPlace", Unsorted({"b", "a"}), Unsorted({"c", "a"}), IN_PLACE,
     Unsorted({"b", "a", "c"})},
    {"UnsortedInPlaceByBytes", Unsorted({"a"}), Unsorted({"A"}), IN_PLACE, Unsorted({"a", "A"})},
    {"UnsortedNewTakesAll", Unsorted({"b", "a"}), Unsorted({"c", "a"}), SZLIST_OR_NEW,
     Unsorted({"b", "a", "c", "a"})},
    // both in one order
    {"SortedInPlace", Bytes({"a", "c", "e"}), Bytes({"b", "c", "f", "g"}), IN_PLACE,
     Bytes({"a", "b", "c", "e", "f", "g"})},
    {"SortedInPlaceAnEndInCommon", Bytes({"b", "z"}), Bytes({"a", "z"}), IN_PLACE,
     Bytes({"a", "b", "z"})},
    {"SortedNew", Bytes({"a", "c", "e"}), Bytes({"b", "c", "f", "g"}), SZLIST_OR_NEW,
     Bytes({"a", "b", "c", "e", "f", "g"})},
    {"SortedAIsLonger", Bytes({"a", "c", "e", "g"}), Bytes({"b"}), SZLIST_OR_NEW,
     Bytes({"a", "b", "c", "e", "g"})},
    {"SortedDuplicatesOfAStay", Bytes({"a", "a"}), Bytes({"a"}), IN_PLACE, Bytes({"a", "a"})},
    {"SortedByBytesTwoApartIsNothingSpecial", Bytes({"a"}), Bytes({"c"}), IN_PLACE,
     Bytes({"a", "c"})},
    {"CaseSortedCopyOfAIsKept", NoCase({"A", "f"}), NoCase({"a", "k"}), IN_PLACE,
     NoCase({"A", "f", "k"})},
    {"CaseSortedNew", NoCase({"A", "f"}), NoCase({"a", "k"}), SZLIST_OR_NEW,
     NoCase({"A", "f", "k"})},
    {"SortedAWithoutItems", Bytes({}), Bytes({"b", "c"}), SZLIST_OR_NEW, Bytes({"b", "c"})},
    {"SortedBWithoutItems", Bytes({"a", "b"}), Bytes({}), SZLIST_OR_NEW, Bytes({"a", "b"})},
    // sorted with unsorted: A's order, duplicates once
    {"OrderOfAInPlace", Bytes({"b", "d"}), Unsorted({"c", "b", "a"}), IN_PLACE,
     Bytes({"a", "b", "c", "d"})},
    {"OrderOfANew", Bytes({"b", "d"}), Unsorted({"c", "b", "a"}), SZLIST_OR_NEW,
     Bytes({"a", "b", "c", "d"})},
    {"OrderOfAWithoutCase", NoCase({"b", "h"}), Unsorted({"B", "m"}), IN_PLACE,
     NoCase({"b", "h", "m"})},
};

TEST_ROWS(SzListMerge, OR_CASES)
{
    const OR_CASE &row = GetParam();
    TEST_LIST a(row.a.items, row.a.fMode);
    const TEST_LIST b(row.b.items, row.b.fMode);
    RecordReset();
    const PNLIBSZLIST pResult = NLIBCSzListOr(&a.p, b.p, row.flags);
    EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    ASSERT_NE(pResult, nullptr);
    EXPECT_EQ(ItemsOf(pResult), row.expected.items);
    EXPECT_EQ(pResult->fMode, row.expected.fMode);
    EXPECT_EQ(Defect(pResult), "");
    EXPECT_EQ(ItemsOf(b.p), row.b.items) << "the other list is only read";
    if (row.flags == SZLIST_OR_NEW) {
        EXPECT_NE(pResult, a.p);
        EXPECT_EQ(ItemsOf(a.p), row.a.items);
        EXPECT_EQ(a.p->fMode, row.a.fMode);
        NLIBCSzListFree(pResult);
    } else {
        EXPECT_EQ(pResult, a.p);
    }
}

TEST(SzListOr, SkipsEmptySlots)
{
    for (const int flags : {IN_PLACE, SZLIST_OR_NEW}) {
        for (const int fModeB : {SZLIST_UNSORTED, SZLIST_SORTED}) {
            TEST_LIST a;
            TEST_LIST b({"q"}, fModeB);
            ASSERT_EQ(NLIBCSzListInsert(&a.p, 2, "p"), 2);
            if (fModeB == SZLIST_UNSORTED) {
                ASSERT_EQ(NLIBCSzListInsert(&b.p, 3, "r"), 3);
            }
            const PNLIBSZLIST pResult = NLIBCSzListOr(&a.p, b.p, flags);
            ASSERT_NE(pResult, nullptr);
            ITEMS items = ItemsOf(pResult);
            std::sort(items.begin(), items.end());
            EXPECT_EQ(items,
                      fModeB == SZLIST_UNSORTED ? (ITEMS{"p", "q", "r"}) : (ITEMS{"p", "q"}));
            if (flags == SZLIST_OR_NEW) {
                EXPECT_EQ(a.p->nItem, 3) << "only a list merged in place is compacted";
                NLIBCSzListFree(pResult);
            }
        }
    }
}

TEST(SzListOr, HandsBackAListThatHasMoved)
{
    for (const int fModeA : {SZLIST_UNSORTED, SZLIST_SORTED, SZLIST_CASE_SORTED}) {
        for (const int fModeB : {SZLIST_UNSORTED, fModeA}) {
            const std::string text(400, 'k');
            TEST_LIST a({std::string(400, 'a')}, fModeA);
            const TEST_LIST b({text}, fModeB);
            const PNLIBSZLIST pResult = NLIBCSzListOr(&a.p, b.p, IN_PLACE);
            ASSERT_NE(pResult, nullptr);
            EXPECT_EQ(pResult, a.p) << "the caller's pointer follows";
            EXPECT_EQ(a.p->nSize, 1024);
            EXPECT_EQ(ItemsOf(a.p), (ITEMS{std::string(400, 'a'), text}));
            EXPECT_EQ(Defect(a.p), "");
        }
    }
}

// Used bytes: header 24, slot 4, 300 characters and their end: 329 a list.
TEST(SzListOr, MakesTheNewListAsLargeAsBothUse)
{
    TEST_LIST a({std::string(300, 'a')}, SZLIST_UNSORTED);
    const TEST_LIST b({std::string(300, 'b')}, SZLIST_UNSORTED);
    ASSERT_EQ(a.p->nSize - a.p->nFree, 329);
    const PNLIBSZLIST pLarge = NLIBCSzListOr(&a.p, b.p, SZLIST_OR_NEW);
    ASSERT_NE(pLarge, nullptr);
    EXPECT_EQ(pLarge->nSize, 658);
    NLIBCSzListFree(pLarge);

    TEST_LIST small({"a"}, SZLIST_UNSORTED);
    const PNLIBSZLIST pSmall = NLIBCSzListOr(&small.p, TEST_LIST().p, SZLIST_OR_NEW);
    ASSERT_NE(pSmall, nullptr);
    EXPECT_EQ(pSmall->nSize, 512);
    NLIBCSzListFree(pSmall);
}

TEST(SzListOr, GivesUpWithoutCaseAtALetterTwoPlacesFurther)
{
    for (const int flags : {IN_PLACE, SZLIST_OR_NEW}) {
        TEST_LIST a({"a", "f"}, SZLIST_CASE_SORTED);
        const TEST_LIST b({"C"}, SZLIST_CASE_SORTED);
        EXPECT_QUIET(NLIBCSzListOr(&a.p, b.p, flags), nullptr);
        EXPECT_EQ(ItemsOf(a.p), (ITEMS{"a", "f"}));
        EXPECT_EQ(a.p->fMode, flags == IN_PLACE ? SZLIST_UNSORTED : SZLIST_CASE_SORTED);
        EXPECT_EQ(Defect(a.p), "");
        // The other way round the difference is +2, which is an ordinary one.
        TEST_LIST c({"C"}, SZLIST_CASE_SORTED);
        const TEST_LIST d({"a", "f"}, SZLIST_CASE_SORTED);
        const PNLIBSZLIST pResult = NLIBCSzListOr(&c.p, d.p, flags);
        ASSERT_NE(pResult, nullptr);
        EXPECT_EQ(ItemsOf(pResult), (ITEMS{"a", "C", "f"}));
        if (flags == SZLIST_OR_NEW) {
            NLIBCSzListFree(pResult);
        }
    }
}

} // namespace
