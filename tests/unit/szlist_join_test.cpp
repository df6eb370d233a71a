// SPDX-License-Identifier: MIT
//
// Texts made of a string list, and lists made of two.
#include "nurocore/szlist.h"

#include "last_error.h"
#include "test_szlist.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>

namespace
{

// A heap buffer that a join may enlarge.
struct JOIN_BUFFER {
    char *psz;
    int cb;

    explicit JOIN_BUFFER(int cbIn)
        : psz(static_cast<char *>(malloc(cbIn > 0 ? static_cast<size_t>(cbIn) : 1))), cb(cbIn)
    {
        memset(psz, 'X', cbIn > 0 ? static_cast<size_t>(cbIn) : 1);
    }
    JOIN_BUFFER(const JOIN_BUFFER &) = delete;
    JOIN_BUFFER &operator=(const JOIN_BUFFER &) = delete;
    ~JOIN_BUFFER()
    {
        free(psz);
    }
};

// Two units of one item and one separator each, and the terminator: 5.
TEST(SzListJoin, EnlargesABufferOfNoBytes)
{
    const TEST_LIST list({"a", "b"}, SZLIST_UNSORTED);
    JOIN_BUFFER buffer(0);
    EXPECT_QUIET(NLIBCSzListJoin(list.p, ",", &buffer.psz, &buffer.cb), 5);
    EXPECT_STREQ(buffer.psz, "a,b");
    EXPECT_EQ(buffer.cb, 5);
}

TEST(SzListJoin, KeepsABufferThatIsLargeEnoughAndClearsTheRest)
{
    const TEST_LIST list({"a", "b"}, SZLIST_UNSORTED);
    JOIN_BUFFER buffer(9);
    EXPECT_QUIET(NLIBCSzListJoin(list.p, ",", &buffer.psz, &buffer.cb), 5);
    EXPECT_EQ(buffer.cb, 9);
    EXPECT_EQ(memcmp(buffer.psz, "a,b\0\0\0\0\0\0", 9), 0);

    JOIN_BUFFER exact(5);
    EXPECT_QUIET(NLIBCSzListJoin(list.p, ",", &exact.psz, &exact.cb), 5);
    EXPECT_EQ(exact.cb, 5);

    JOIN_BUFFER tooSmall(4);
    EXPECT_QUIET(NLIBCSzListJoin(list.p, ",", &tooSmall.psz, &tooSmall.cb), 5);
    EXPECT_EQ(tooSmall.cb, 5);
    EXPECT_STREQ(tooSmall.psz, "a,b");
}

TEST(SzListJoin, CountsALongSeparatorOncePerItem)
{
    const TEST_LIST list({"sda1", "sdb1", "sdc1"}, SZLIST_UNSORTED);
    JOIN_BUFFER buffer(0);
    EXPECT_QUIET(NLIBCSzListJoin(list.p, " /dev/", &buffer.psz, &buffer.cb), 3 * (4 + 6) + 1);
    EXPECT_STREQ(buffer.psz, "sda1 /dev/sdb1 /dev/sdc1");

    JOIN_BUFFER bare(0);
    EXPECT_QUIET(NLIBCSzListJoin(list.p, "", &bare.psz, &bare.cb), 13);
    EXPECT_STREQ(bare.psz, "sda1sdb1sdc1");
}

TEST(SzListJoin, JoinsEmptySlotsAsEmptyTexts)
{
    TEST_LIST list({"a"}, SZLIST_UNSORTED);
    ASSERT_EQ(NLIBCSzListInsert(&list.p, 2, "b"), 2);
    JOIN_BUFFER buffer(0);
    EXPECT_QUIET(NLIBCSzListJoin(list.p, ",", &buffer.psz, &buffer.cb), 6);
    EXPECT_STREQ(buffer.psz, "a,,b");
}

TEST(SzListJoin, LeavesTheBufferToAnEmptyList)
{
    const TEST_LIST list;
    JOIN_BUFFER buffer(3);
    EXPECT_QUIET(NLIBCSzListJoin(list.p, ",", &buffer.psz, &buffer.cb), 0);
    EXPECT_EQ(std::string(buffer.psz, 3), std::string(3, 'X'));
    EXPECT_EQ(buffer.cb, 3);
}

TEST(SzListDump2Str, WritesWhatFits)
{
    const TEST_LIST list({"ab", "cd"}, SZLIST_UNSORTED);
    char szOut[16];
    EXPECT_QUIET(NLIBCSzListDump2Str(list.p, ",", szOut, 16), 5);
    EXPECT_STREQ(szOut, "ab,cd");
    EXPECT_QUIET(NLIBCSzListDump2Str(list.p, ",", szOut, 6), 5);
    EXPECT_STREQ(szOut, "ab,cd");
    EXPECT_QUIET(NLIBCSzListDump2Str(list.p, "", szOut, 5), 4);
    EXPECT_STREQ(szOut, "abcd");
    EXPECT_QUIET(NLIBCSzListDump2Str(list.p, " and ", szOut, 16), 9);
    EXPECT_STREQ(szOut, "ab and cd");
}

TEST(SzListDump2Str, StopsBeforeTheUnitThatDoesNotFit)
{
    const TEST_LIST list({"ab", "cd"}, SZLIST_UNSORTED);
    struct CASE {
        int cbOut;
        const char *szLeft;
    };
    for (const CASE &row : {CASE{5, "ab"}, CASE{3, "ab"}, CASE{2, ""}, CASE{1, ""}}) {
        char szOut[8] = "XXXXXXX";
        EXPECT_FAILS(NLIBCSzListDump2Str(list.p, ",", szOut, row.cbOut), -1, ERR_OUT_OF_SPACE);
        EXPECT_STREQ(szOut, row.szLeft) << row.cbOut;
        EXPECT_EQ(szOut[row.cbOut], 'X') << "nothing behind the caller's bytes";
    }
}

TEST(SzListDump2Str, ClearsTheWholeText)
{
    char achOut[8] = {'X', 'X', 'X', 'X', 'X', 'X', 'X', 'X'};
    EXPECT_QUIET(NLIBCSzListDump2Str(TEST_LIST().p, ",", achOut, 7), 0);
    EXPECT_EQ(std::string(achOut, 8), std::string(7, '\0') + "X");

    memset(achOut, 'X', 8);
    EXPECT_QUIET(NLIBCSzListDump2Str(TEST_LIST({"ab"}, SZLIST_UNSORTED).p, ",", achOut, 7), 2);
    EXPECT_EQ(std::string(achOut, 8), "ab" + std::string(5, '\0') + "X");

    memset(achOut, 'X', 8);
    const TEST_LIST list({"ab", "cdefg"}, SZLIST_UNSORTED);
    EXPECT_FAILS(NLIBCSzListDump2Str(list.p, ",", achOut, 7), -1, ERR_OUT_OF_SPACE);
    EXPECT_EQ(std::string(achOut, 8), "ab" + std::string(5, '\0') + "X");
}

constexpr int IN_PLACE = 0;
constexpr int IN_PLACE_KEEP = 1; // neither 0 nor the flag of a new list

struct OR_CASE {
    const char *szWhat;
    ITEMS a;
    int fModeA;
    ITEMS b;
    int fModeB;
    int flags;
    ITEMS expected;
    int fModeExpected;
};

const OR_CASE OR_CASES[] = {
    // unsorted with sorted: B's items, and what only A holds
    {"in place, A's copies removed",
     {"c", "x", "b"},
     0,
     {"b", "c"},
     1,
     IN_PLACE,
     {"x", "b", "c"},
     0},
    {"in place, A's copies kept",
     {"c", "x", "b"},
     0,
     {"b", "c"},
     1,
     IN_PLACE_KEEP,
     {"c", "x", "b", "b", "c"},
     0},
    {"new", {"c", "x", "b"}, 0, {"b", "c"}, 1, SZLIST_OR_NEW, {"b", "c", "x"}, 0},
    {"every copy of A's removed", {"b", "b", "x"}, 0, {"b"}, 1, IN_PLACE, {"x", "b"}, 0},
    {"by bytes, case tells apart", {"B", "x"}, 0, {"b"}, 1, IN_PLACE, {"B", "x", "b"}, 0},
    {"without case, in place", {"B", "x"}, 0, {"b"}, 16, IN_PLACE, {"x", "b"}, 0},
    {"without case, new", {"B", "x"}, 0, {"b"}, 16, SZLIST_OR_NEW, {"b", "x"}, 0},
    {"A without items", {}, 0, {"b", "c"}, 1, IN_PLACE, {"b", "c"}, 0},
    {"B without items", {"a"}, 0, {}, 1, IN_PLACE, {"a"}, 0},
    {"B without items, new", {"b", "a"}, 0, {}, 1, SZLIST_OR_NEW, {"b", "a"}, 0},
    // both unsorted
    {"unsorted, in place", {"b", "a"}, 0, {"c", "a"}, 0, IN_PLACE, {"b", "a", "c"}, 0},
    {"unsorted, in place by bytes", {"a"}, 0, {"A"}, 0, IN_PLACE, {"a", "A"}, 0},
    {"unsorted, new takes all",
     {"b", "a"},
     0,
     {"c", "a"},
     0,
     SZLIST_OR_NEW,
     {"b", "a", "c", "a"},
     0},
    // both in one order
    {"sorted, in place",
     {"a", "c", "e"},
     1,
     {"b", "c", "f", "g"},
     1,
     IN_PLACE,
     {"a", "b", "c", "e", "f", "g"},
     1},
    {"sorted, in place, an end in common",
     {"b", "z"},
     1,
     {"a", "z"},
     1,
     IN_PLACE,
     {"a", "b", "z"},
     1},
    {"sorted, new",
     {"a", "c", "e"},
     1,
     {"b", "c", "f", "g"},
     1,
     SZLIST_OR_NEW,
     {"a", "b", "c", "e", "f", "g"},
     1},
    {"sorted, A is longer",
     {"a", "c", "e", "g"},
     1,
     {"b"},
     1,
     SZLIST_OR_NEW,
     {"a", "b", "c", "e", "g"},
     1},
    {"sorted, A's own duplicates stay", {"a", "a"}, 1, {"a"}, 1, IN_PLACE, {"a", "a"}, 1},
    {"sorted by bytes, two apart is nothing special", {"a"}, 1, {"c"}, 1, IN_PLACE, {"a", "c"}, 1},
    {"without case, A's copy is kept",
     {"A", "f"},
     16,
     {"a", "k"},
     16,
     IN_PLACE,
     {"A", "f", "k"},
     16},
    {"without case, new", {"A", "f"}, 16, {"a", "k"}, 16, SZLIST_OR_NEW, {"A", "f", "k"}, 16},
    {"sorted, A without items", {}, 1, {"b", "c"}, 1, SZLIST_OR_NEW, {"b", "c"}, 1},
    {"sorted, B without items", {"a", "b"}, 1, {}, 1, SZLIST_OR_NEW, {"a", "b"}, 1},
    // sorted with unsorted: A's order, duplicates once
    {"A's order, in place", {"b", "d"}, 1, {"c", "b", "a"}, 0, IN_PLACE, {"a", "b", "c", "d"}, 1},
    {"A's order, new", {"b", "d"}, 1, {"c", "b", "a"}, 0, SZLIST_OR_NEW, {"a", "b", "c", "d"}, 1},
    {"A's order without case", {"b", "h"}, 16, {"B", "m"}, 0, IN_PLACE, {"b", "h", "m"}, 16},
};

TEST(SzListOr, FollowsTheOrdersOfBoth)
{
    for (const OR_CASE &row : OR_CASES) {
        SCOPED_TRACE(row.szWhat);
        TEST_LIST a(row.a, row.fModeA);
        const TEST_LIST b(row.b, row.fModeB);
        const bool fNew = row.flags == SZLIST_OR_NEW;
        RecordReset();
        const PNLIBSZLIST pResult = NLIBCSzListOr(&a.p, b.p, row.flags);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
        ASSERT_NE(pResult, nullptr);
        EXPECT_EQ(ItemsOf(pResult), row.expected);
        EXPECT_EQ(pResult->fMode, row.fModeExpected);
        EXPECT_EQ(Defect(pResult), "");
        EXPECT_EQ(ItemsOf(b.p), row.b) << "the other list is only read";
        if (fNew) {
            EXPECT_NE(pResult, a.p);
            EXPECT_EQ(ItemsOf(a.p), row.a);
            EXPECT_EQ(a.p->fMode, row.fModeA);
            NLIBCSzListFree(pResult);
        } else {
            EXPECT_EQ(pResult, a.p);
        }
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
