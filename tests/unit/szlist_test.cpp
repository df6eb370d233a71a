// SPDX-License-Identifier: MIT
#include "nurocore/szlist.h"

#include "last_error.h"
#include "test_files.h"
#include "test_szlist.h"

#include <climits>
#include <cstdio>

namespace
{

TEST(SzListAlloc, GivesAtLeast512Bytes)
{
    for (const int nSize : {0, -1, INT_MIN, 1, 511, 512}) {
        const TEST_LIST list(nSize);
        ASSERT_NE(list.p, nullptr);
        EXPECT_EQ(list.p->nSize, 512) << nSize;
        EXPECT_EQ(list.p->nFree, 488) << nSize;
    }
}

TEST(SzListAlloc, StartsEmptyAndUnsorted)
{
    const TEST_LIST list(1024);
    EXPECT_EQ(list.p->nSize, 1024);
    EXPECT_EQ(list.p->nItem, 0);
    EXPECT_EQ(list.p->nFree, 1000);
    EXPECT_EQ(list.p->fMode, 0);
    EXPECT_EQ(list.p->EndofFree, 1024);
    EXPECT_EQ(list.p->pszEmpty, 1023);
    EXPECT_EQ(Defect(list.p), "");
}

// Strings of three characters take 3 + 1 bytes and a slot of 4: 488 / 8 = 61 of them fill the
// block to its last byte, and 1000 / 8 = 125 the next one.
TEST(SzListPush, DoublesAFullBlockAndKeepsTheOrder)
{
    TEST_LIST list(512);
    ITEMS expected;
    const auto PushUpTo = [&](int nItem) {
        for (int i = static_cast<int>(expected.size()); i < nItem; i++) {
            char szItem[8];
            (void)snprintf(szItem, sizeof(szItem), "%03d", i);
            ASSERT_EQ(NLIBCSzListPush(&list.p, szItem), i);
            expected.emplace_back(szItem);
        }
        EXPECT_EQ(Defect(list.p), "");
        EXPECT_EQ(ItemsOf(list.p), expected);
    };
    PushUpTo(61);
    EXPECT_EQ(list.p->nSize, 512);
    EXPECT_EQ(list.p->nFree, 0);
    PushUpTo(62);
    EXPECT_EQ(list.p->nSize, 1024);
    EXPECT_EQ(list.p->nFree, 504);
    PushUpTo(125);
    EXPECT_EQ(list.p->nSize, 1024);
    EXPECT_EQ(list.p->nFree, 0);
    PushUpTo(126);
    EXPECT_EQ(list.p->nSize, 2048);
    EXPECT_EQ(list.p->nFree, 2024 - 126 * 8);
}

// 3000 characters need 3005 bytes; 488, 1000 and 2024 do not hold them, 4072 do.
TEST(SzListPush, DoublesUntilALongStringFits)
{
    TEST_LIST list(512);
    ASSERT_EQ(NLIBCSzListPush(&list.p, "first"), 0);
    const std::string text(3000, 'x');
    ASSERT_EQ(NLIBCSzListPush(&list.p, text.c_str()), 1);
    EXPECT_EQ(list.p->nSize, 4096);
    EXPECT_EQ(list.p->nFree, 4072 - 10 - 3005);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"first", text}));
    EXPECT_EQ(Defect(list.p), "");
}

TEST(SzListPush, KeepsACopy)
{
    TEST_LIST list;
    char szItem[] = "sda";
    ASSERT_EQ(NLIBCSzListPush(&list.p, szItem), 0);
    szItem[2] = 'b';
    EXPECT_STREQ(NLIBCSzListGet(list.p, 0), "sda");
}

// Blocks of this size are overwritten when they are freed; the smallest ones are not.
constexpr int OVERWRITTEN_SIZE = 2048;

TEST(SzListPush, TakesAStringThatLiesInTheBlockItself)
{
    const FREED_MEMORY_SCOPE overwritten;
    TEST_LIST list(OVERWRITTEN_SIZE);
    const std::string text(1500, 'y');
    ASSERT_EQ(NLIBCSzListPush(&list.p, text.c_str()), 0);
    ASSERT_EQ(NLIBCSzListPush(&list.p, NLIBCSzListGet(list.p, 0)), 1); // this one grows
    EXPECT_EQ(list.p->nSize, 2 * OVERWRITTEN_SIZE);
    ASSERT_EQ(NLIBCSzListPush(&list.p, NLIBCSzListGet(list.p, 1) + 1499), 2);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{text, text, "y"}));
    EXPECT_EQ(Defect(list.p), "");
}

TEST(SzListPush, TakesAStringOfTheBlockThroughSeveralDoublings)
{
    const FREED_MEMORY_SCOPE overwritten;
    TEST_LIST list(OVERWRITTEN_SIZE);
    ASSERT_EQ(NLIBCSzListPush(&list.p, "kept"), 0);
    ASSERT_EQ(NLIBCSzListInsert(&list.p, 4000, NLIBCSzListGet(list.p, 0)), 4000);
    EXPECT_STREQ(NLIBCSzListGet(list.p, 0), "kept");
    EXPECT_STREQ(NLIBCSzListGet(list.p, 4000), "kept");
    EXPECT_EQ(Defect(list.p), "");
}

TEST(SzListPushHead, InsertsBeforeTheFirst)
{
    TEST_LIST list;
    EXPECT_QUIET(NLIBCSzListPushHead(&list.p, "b"), 0);
    EXPECT_QUIET(NLIBCSzListPushHead(&list.p, "a"), 0);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"a", "b"}));
}

TEST(SzListInsert, MovesWhatFollowsUp)
{
    TEST_LIST list({"a", "c", "d"}, SZLIST_UNSORTED);
    const i32 nFree = list.p->nFree;
    EXPECT_QUIET(NLIBCSzListInsert(&list.p, 1, "b"), 1);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"a", "b", "c", "d"}));
    EXPECT_EQ(list.p->nFree, nFree - 6); // one character, its end, one slot
    EXPECT_EQ(Defect(list.p), "");
}

TEST(SzListInsert, LeavesEmptySlotsBeforeAnIndexBeyondTheEnd)
{
    TEST_LIST list(512);
    EXPECT_QUIET(NLIBCSzListInsert(&list.p, 5, "six"), 5);
    EXPECT_EQ(list.p->nItem, 6);
    EXPECT_EQ(list.p->nFree, 488 - 6 * 4 - 4);
    for (int i = 0; i < 5; i++) {
        EXPECT_TRUE(IsEmptySlot(list.p, i)) << i;
        EXPECT_STREQ(NLIBCSzListGet(list.p, i), "") << i;
    }
    EXPECT_QUIET(NLIBCSzListFind(list.p, ""), -1);
    EXPECT_QUIET(NLIBCSzListCaseFind(list.p, ""), -1);
    EXPECT_QUIET(NLIBCSzListFind(list.p, "six"), 5);
    EXPECT_EQ(Defect(list.p), "");
}

TEST(SzListInsert, EmptySlotsSurviveGrowth)
{
    TEST_LIST list(512);
    ASSERT_EQ(NLIBCSzListInsert(&list.p, 2, "third"), 2);
    ASSERT_EQ(NLIBCSzListPush(&list.p, std::string(600, 'z').c_str()), 3);
    EXPECT_EQ(list.p->nSize, 1024);
    EXPECT_TRUE(IsEmptySlot(list.p, 0));
    EXPECT_TRUE(IsEmptySlot(list.p, 1));
    EXPECT_STREQ(NLIBCSzListGet(list.p, 2), "third");
    EXPECT_EQ(Defect(list.p), "");
}

TEST(SzListInsert, AnEmptyStringIsAnItem)
{
    TEST_LIST list({"a", ""}, SZLIST_UNSORTED);
    EXPECT_QUIET(NLIBCSzListFind(list.p, ""), 1);
    NLIBCSzListCompact(list.p);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"a", ""}));
}

// Its only byte is the block's last one, and that is how an empty slot is told.
TEST(SzListInsert, AnEmptyStringThatIsStoredFirstIsAnEmptySlot)
{
    TEST_LIST list({"", "a"}, SZLIST_UNSORTED);
    EXPECT_TRUE(IsEmptySlot(list.p, 0));
    EXPECT_QUIET(NLIBCSzListFind(list.p, ""), -1);
    NLIBCSzListCompact(list.p);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"a"}));
}

// No block has 2^31 bytes, so the slots before such an index never fit one.
TEST(SzListInsert, FailsWhenNoBlockIsLargeEnoughAndKeepsTheItems)
{
    for (const int index : {INT_MAX, INT_MAX / 4}) {
        TEST_LIST list({"a", "b"}, SZLIST_UNSORTED);
        EXPECT_FAILS(NLIBCSzListInsert(&list.p, index, "far"), -1, ERR_OUT_OF_MEMORY);
        EXPECT_EQ(ItemsOf(list.p), (ITEMS{"a", "b"}));
        EXPECT_EQ(Defect(list.p), "");
    }
}

TEST(SzListInsert, ASortedListChoosesThePlace)
{
    TEST_LIST list(512);
    NLIBCSzListSort(list.p, SZLIST_SORTED);
    EXPECT_QUIET(NLIBCSzListInsert(&list.p, 99, "m"), 0);
    EXPECT_QUIET(NLIBCSzListInsert(&list.p, 0, "z"), 1);
    EXPECT_QUIET(NLIBCSzListPush(&list.p, "a"), 0);
    EXPECT_QUIET(NLIBCSzListPushHead(&list.p, "p"), 2);
    EXPECT_QUIET(NLIBCSzListPush(&list.p, "Z"), 0);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"Z", "a", "m", "p", "z"}));
    EXPECT_EQ(Defect(list.p), "");
}

TEST(SzListInsert, ADuplicateGoesWhereTheSearchHitsItsEqual)
{
    TEST_LIST list({"a", "b", "c"}, SZLIST_SORTED);
    EXPECT_QUIET(NLIBCSzListPush(&list.p, "c"), 2);
    EXPECT_QUIET(NLIBCSzListPush(&list.p, "b"), 1);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"a", "b", "b", "c", "c"}));
}

TEST(SzListInsert, ACaseSortedListOrdersWithoutCase)
{
    TEST_LIST list(512);
    NLIBCSzListSort(list.p, SZLIST_CASE_SORTED);
    EXPECT_QUIET(NLIBCSzListPush(&list.p, "m"), 0);
    EXPECT_QUIET(NLIBCSzListPush(&list.p, "Z"), 1);
    EXPECT_QUIET(NLIBCSzListPush(&list.p, "A"), 0);
    EXPECT_QUIET(NLIBCSzListPush(&list.p, "a"), 0); // before its equal
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"a", "A", "m", "Z"}));
}

TEST(SzListInsert, AModeThatIsNoOrderTakesTheIndex)
{
    TEST_LIST list({"c", "a"}, 2);
    EXPECT_QUIET(NLIBCSzListInsert(&list.p, 1, "b"), 1);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"c", "b", "a"}));
}

TEST(SzListFind, TellsTheFirstEqualItemOfAnUnsortedList)
{
    const TEST_LIST list({"sdb", "sda", "SDA", "sda"}, SZLIST_UNSORTED);
    EXPECT_QUIET(NLIBCSzListFind(list.p, "sda"), 1);
    EXPECT_QUIET(NLIBCSzListFind(list.p, "SDA"), 2);
    EXPECT_QUIET(NLIBCSzListFind(list.p, "sd"), -1);
    EXPECT_QUIET(NLIBCSzListFind(list.p, ""), -1);
    EXPECT_QUIET(NLIBCSzListCaseFind(list.p, "SDa"), 1);
    EXPECT_QUIET(NLIBCSzListCaseFind(list.p, "sdc"), -1);
}

TEST(SzListFind, SearchesASortedListByHalves)
{
    const TEST_LIST list({"a", "c", "e", "g", "i"}, SZLIST_SORTED);
    for (int i = 0; i < 5; i++) {
        EXPECT_QUIET(NLIBCSzListFind(list.p, NLIBCSzListGet(list.p, i)), i);
    }
    for (const char *szAbsent : {"", "A", "b", "d", "f", "h", "j", "aa"}) {
        EXPECT_QUIET(NLIBCSzListFind(list.p, szAbsent), -1);
    }
    EXPECT_QUIET(NLIBCSzListFind(TEST_LIST({}, SZLIST_SORTED).p, "a"), -1);
    EXPECT_QUIET(NLIBCSzListCaseFind(TEST_LIST({}, SZLIST_CASE_SORTED).p, "a"), -1);
}

// Halving would look for "a" before "b" and for "c" behind it.
TEST(SzListFind, AModeThatIsNoOrderIsSearchedFromTheStart)
{
    constexpr int NO_ORDER = 2;
    const TEST_LIST list({"c", "b", "a"}, NO_ORDER);
    ASSERT_EQ(list.p->fMode, NO_ORDER);
    for (const char *szItem : {"a", "b", "c"}) {
        EXPECT_QUIET(NLIBCSzListFind(list.p, szItem), 'c' - szItem[0]);
        EXPECT_QUIET(NLIBCSzListCaseFind(list.p, szItem), 'c' - szItem[0]);
    }
    EXPECT_QUIET(NLIBCSzListFind(list.p, "d"), -1);
    EXPECT_QUIET(NLIBCSzListCaseFind(list.p, "d"), -1);
}

// The middle of 0..3 is 1, the middle of 0..2 is 1, the middle of 0..4 is 2.
TEST(SzListFind, AmongDuplicatesAnswersWhatTheHalvingHits)
{
    EXPECT_EQ(NLIBCSzListFind(TEST_LIST({"a", "b", "b", "b"}, SZLIST_SORTED).p, "b"), 1);
    EXPECT_EQ(NLIBCSzListFind(TEST_LIST({"b", "b", "b"}, SZLIST_SORTED).p, "b"), 1);
    EXPECT_EQ(NLIBCSzListFind(TEST_LIST({"b", "b", "b", "b", "b"}, SZLIST_SORTED).p, "b"), 2);
    EXPECT_EQ(NLIBCSzListCaseFind(TEST_LIST({"b", "B", "b"}, SZLIST_CASE_SORTED).p, "B"), 1);
}

// 'a' is two before 'c', the middle of five: the search gives up there although item 0 is equal.
TEST(SzListCaseFind, GivesUpAtALetterTwoPlacesFurther)
{
    const TEST_LIST nocase({"a", "b", "c", "d", "e"}, SZLIST_CASE_SORTED);
    EXPECT_QUIET(NLIBCSzListCaseFind(nocase.p, "a"), -1);
    EXPECT_QUIET(NLIBCSzListCaseFind(nocase.p, "A"), -1);
    EXPECT_QUIET(NLIBCSzListCaseFind(nocase.p, "b"), 1);
    EXPECT_QUIET(NLIBCSzListCaseFind(nocase.p, "e"), 4);
    // Lower-cased bytes count: 'X' is two before 'z', and '_' is two before 'A'.
    EXPECT_QUIET(NLIBCSzListCaseFind(TEST_LIST({"x", "Z"}, SZLIST_CASE_SORTED).p, "X"), 0);
    EXPECT_QUIET(NLIBCSzListCaseFind(TEST_LIST({"X", "z", "z"}, SZLIST_CASE_SORTED).p, "x"), -1);
    EXPECT_QUIET(NLIBCSzListCaseFind(TEST_LIST({"_", "A", "b"}, SZLIST_CASE_SORTED).p, "_"), -1);
    const TEST_LIST bytes({"a", "b", "c", "d", "e"}, SZLIST_SORTED);
    EXPECT_QUIET(NLIBCSzListFind(bytes.p, "a"), 0);
}

// The middle of three is 'd', and 'b' is two before it: the low bound at that moment is 0.
TEST(SzListCaseFind, AnInsertionThatGivesUpGoesToTheLowBound)
{
    TEST_LIST list({"a", "d", "e"}, SZLIST_CASE_SORTED);
    EXPECT_QUIET(NLIBCSzListPush(&list.p, "b"), 0);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"b", "a", "d", "e"}));

    TEST_LIST held({"a", "b", "c", "d", "e"}, SZLIST_CASE_SORTED);
    EXPECT_QUIET(NLIBCSzListPush(&held.p, "A"), 0);
    EXPECT_EQ(ItemsOf(held.p), (ITEMS{"A", "a", "b", "c", "d", "e"}));

    // After 'c' in the middle the low bound is 3; there 'd' is two before 'f'.
    TEST_LIST upper({"a", "b", "c", "f", "g"}, SZLIST_CASE_SORTED);
    EXPECT_QUIET(NLIBCSzListPush(&upper.p, "d"), 3);
    EXPECT_EQ(ItemsOf(upper.p), (ITEMS{"a", "b", "c", "d", "f", "g"}));
}

TEST(SzListRemove, ClosesTheGapAndGivesFourBytesBack)
{
    TEST_LIST list({"a", "b", "c"}, SZLIST_UNSORTED);
    const i32 nFree = list.p->nFree;
    const i32 endOfFree = list.p->EndofFree;
    RecordReset();
    EXPECT_STREQ(NLIBCSzListRemove(list.p, 1), "b") << "the bytes stay in the block";
    EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"a", "c"}));
    EXPECT_EQ(list.p->nFree, nFree + 4);
    EXPECT_EQ(list.p->EndofFree, endOfFree);
    EXPECT_EQ(Defect(list.p), "");
}

TEST(SzListRemove, OfTheLastItemGivesTheSlotBackButNotTheBytes)
{
    TEST_LIST list(512);
    ASSERT_EQ(NLIBCSzListPush(&list.p, "abc"), 0); // 488 - 8
    EXPECT_STREQ(NLIBCSzListRemove(list.p, 0), "abc");
    EXPECT_EQ(list.p->nFree, 484);
    ASSERT_EQ(NLIBCSzListPush(&list.p, "def"), 0);
    EXPECT_EQ(list.p->nFree, 476);
    EXPECT_EQ(list.p->EndofFree, 512 - 8);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"def"}));
}

TEST(SzListExpand, DoublesTheBlockAndDropsDeadBytes)
{
    TEST_LIST list({"abcd", "efgh", "ijkl"}, SZLIST_SORTED);
    ASSERT_NE(NLIBCSzListRemove(list.p, 1), nullptr);
    const PNLIBSZLIST pNew = NLIBCSzListExpand(list.p);
    ASSERT_NE(pNew, nullptr);
    list.p = pNew;
    EXPECT_EQ(list.p->nSize, 1024);
    EXPECT_EQ(list.p->nFree, 1000 - 2 * 9);
    EXPECT_EQ(list.p->fMode, SZLIST_SORTED);
    EXPECT_EQ(list.p->EndofFree, 1024 - 2 * 5);
    EXPECT_EQ(SlotOf(list.p, 0), 1024 - 5) << "packed downward in slot order";
    EXPECT_EQ(SlotOf(list.p, 1), 1024 - 10);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"abcd", "ijkl"}));
    EXPECT_EQ(Defect(list.p), "");
}

// Growing stores the strings anew in slot order, and the first one ends in the block's last byte.
TEST(SzListExpand, AnEmptyStringThatIsTheFirstOneTurnsIntoAnEmptySlot)
{
    TEST_LIST list({"a"}, SZLIST_UNSORTED);
    ASSERT_EQ(NLIBCSzListPushHead(&list.p, ""), 0);
    ASSERT_EQ(NLIBCSzListPush(&list.p, ""), 2);
    EXPECT_QUIET(NLIBCSzListFind(list.p, ""), 0);
    list.p = NLIBCSzListExpand(list.p);
    EXPECT_TRUE(IsEmptySlot(list.p, 0));
    EXPECT_FALSE(IsEmptySlot(list.p, 2));
    EXPECT_QUIET(NLIBCSzListFind(list.p, ""), 2);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"", "a", ""}));
    EXPECT_EQ(Defect(list.p), "");
}

// Slot 0 is skipped, so the empty string in slot 1 is the first one.
TEST(SzListExpand, AnEmptyStringBehindSkippedSlotsTurnsIntoOneToo)
{
    TEST_LIST list;
    ASSERT_EQ(NLIBCSzListInsert(&list.p, 1, "a"), 1);
    ASSERT_EQ(NLIBCSzListInsert(&list.p, 1, ""), 1);
    EXPECT_QUIET(NLIBCSzListFind(list.p, ""), 1);
    list.p = NLIBCSzListExpand(list.p);
    EXPECT_TRUE(IsEmptySlot(list.p, 1));
    EXPECT_QUIET(NLIBCSzListFind(list.p, ""), -1);
}

TEST(SzListSet, CopiesAShorterStringOverTheOld)
{
    TEST_LIST list({"abc", "def"}, SZLIST_UNSORTED);
    const i32 nFree = list.p->nFree;
    const i32 offset = SlotOf(list.p, 0);
    EXPECT_QUIET(NLIBCSzListSet(&list.p, 0, "xyz"), 0);
    EXPECT_QUIET(NLIBCSzListSet(&list.p, 0, "q"), 0);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"q", "def"}));
    EXPECT_EQ(SlotOf(list.p, 0), offset);
    EXPECT_EQ(list.p->nFree, nFree);
}

TEST(SzListSet, TakesNewBytesForALongerString)
{
    TEST_LIST list({"abc", "def"}, SZLIST_UNSORTED);
    const i32 nFree = list.p->nFree;
    const i32 endOfFree = list.p->EndofFree;
    EXPECT_QUIET(NLIBCSzListSet(&list.p, 1, "longer"), 1);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"abc", "longer"}));
    EXPECT_EQ(list.p->nFree, nFree - 7);
    EXPECT_EQ(SlotOf(list.p, 1), endOfFree - 7);
    EXPECT_EQ(list.p->nSize, 512);
    EXPECT_EQ(Defect(list.p), "");
}

// 24 bytes of header, two slots, 10 bytes free, strings of 468 and 2: the 14 bytes of the new one
// begin where the second slot does, and the slot is written last.
TEST(SzListSet, DoesNotLookWhetherALongerStringFits)
{
    TEST_LIST list({std::string(467, 'a'), "b"}, SZLIST_UNSORTED);
    ASSERT_EQ(list.p->nFree, 10);
    EXPECT_QUIET(NLIBCSzListSet(&list.p, 1, "0123456789abc"), 1);
    EXPECT_EQ(list.p->nFree, -4);
    EXPECT_EQ(list.p->EndofFree, 28);
    EXPECT_EQ(SlotOf(list.p, 1), 28);
    EXPECT_STREQ(NLIBCSzListGet(list.p, 1) + 4, "456789abc");
    EXPECT_EQ(list.p->nSize, 512);
}

TEST(SzListSet, FillsAnEmptySlotAndKeepsTheBlocksLastByte)
{
    TEST_LIST list(512);
    ASSERT_EQ(NLIBCSzListInsert(&list.p, 2, "last"), 2);
    EXPECT_QUIET(NLIBCSzListSet(&list.p, 0, ""), 0);
    EXPECT_TRUE(IsEmptySlot(list.p, 0));
    EXPECT_QUIET(NLIBCSzListSet(&list.p, 1, "x"), 1);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"", "x", "last"}));
    EXPECT_EQ(Defect(list.p), "");
}

TEST(SzListSet, TakesAPartOfTheStringItReplaces)
{
    TEST_LIST list({"/dev/sda"}, SZLIST_UNSORTED);
    EXPECT_QUIET(NLIBCSzListSet(&list.p, 0, NLIBCSzListGet(list.p, 0) + 5), 0);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"sda"}));
}

TEST(SzListSet, SortsASortedListAgainAndTellsTheNewPlace)
{
    TEST_LIST list({"b", "d", "f"}, SZLIST_SORTED);
    EXPECT_QUIET(NLIBCSzListSet(&list.p, 0, "e"), 1);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"d", "e", "f"}));
    EXPECT_QUIET(NLIBCSzListSet(&list.p, 2, "another"), 0);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"another", "d", "e"}));
    EXPECT_EQ(Defect(list.p), "");
}

TEST(SzListSet, OfACaseSortedListIsMadeAndReportedAsAFailure)
{
    TEST_LIST list({"b", "d", "f"}, SZLIST_CASE_SORTED);
    EXPECT_FAILS(NLIBCSzListSet(&list.p, 0, "E"), -1, ERR_BAD_PARAMETER);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"d", "E", "f"}));
}

TEST(SzListSort, ByBytes)
{
    TEST_LIST list({"sdb", "SDC", "sda", "sd"}, SZLIST_UNSORTED);
    NLIBCSzListSort(list.p, SZLIST_SORTED);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"SDC", "sd", "sda", "sdb"}));
    EXPECT_EQ(list.p->fMode, 1);
    EXPECT_EQ(Defect(list.p), "");
}

TEST(SzListSort, ByBytesTakesThemAsUnsigned)
{
    TEST_LIST list({"\xE9t\xE9", "zoo"}, SZLIST_UNSORTED);
    NLIBCSzListSort(list.p, SZLIST_SORTED);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"zoo", "\xE9t\xE9"}));
    NLIBCSzListSort(list.p, SZLIST_UNSORTED);
    NLIBCSzListSort(list.p, SZLIST_CASE_SORTED);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"zoo", "\xE9t\xE9"}));
}

TEST(SzListSort, WithoutCaseKeepsTheOrderOfEquals)
{
    TEST_LIST list({"b", "C", "B", "a", "c", "A"}, SZLIST_UNSORTED);
    NLIBCSzListSort(list.p, SZLIST_CASE_SORTED);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"a", "A", "b", "B", "C", "c"}));
    EXPECT_EQ(list.p->fMode, 16);
}

// '_' lies between the upper and the lower letters: only lower-casing puts it before both.
TEST(SzListSort, WithoutCaseComparesLowerCase)
{
    TEST_LIST list({"B", "_", "a"}, SZLIST_UNSORTED);
    NLIBCSzListSort(list.p, SZLIST_CASE_SORTED);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"_", "a", "B"}));
}

TEST(SzListSort, TheLowBitWins)
{
    TEST_LIST list({"a", "B"}, SZLIST_UNSORTED);
    NLIBCSzListSort(list.p, 17);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"B", "a"}));
    EXPECT_EQ(list.p->fMode, 17);
}

TEST(SzListSort, ToNoOrderOnlyCompacts)
{
    for (const int fMode : {0, 2}) {
        TEST_LIST list(512);
        ASSERT_EQ(NLIBCSzListInsert(&list.p, 1, "b"), 1);
        ASSERT_EQ(NLIBCSzListPush(&list.p, "a"), 2);
        const i32 nFree = list.p->nFree;
        NLIBCSzListSort(list.p, fMode);
        EXPECT_EQ(ItemsOf(list.p), (ITEMS{"b", "a"}));
        EXPECT_EQ(list.p->nFree, nFree + 4);
        EXPECT_EQ(list.p->fMode, fMode);
    }
}

TEST(SzListSort, FromOneOrderToAnotherOnlyStoresTheMode)
{
    TEST_LIST list({"a", "B"}, SZLIST_SORTED);
    for (const int fMode : {SZLIST_CASE_SORTED, SZLIST_SORTED, SZLIST_CASE_SORTED, 0}) {
        NLIBCSzListSort(list.p, fMode);
        EXPECT_EQ(ItemsOf(list.p), (ITEMS{"B", "a"}));
        EXPECT_EQ(list.p->fMode, fMode);
    }
}

TEST(SzListCompact, DropsTheEmptySlots)
{
    TEST_LIST list(512);
    ASSERT_EQ(NLIBCSzListInsert(&list.p, 2, "a"), 2);
    ASSERT_EQ(NLIBCSzListInsert(&list.p, 5, "b"), 5);
    const i32 nFree = list.p->nFree;
    NLIBCSzListCompact(list.p);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"a", "b"}));
    EXPECT_EQ(list.p->nFree, nFree + 4 * 4);
    EXPECT_EQ(Defect(list.p), "");
    NLIBCSzListCompact(list.p);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"a", "b"}));
}

TEST(SzListClear, KeepsTheBlockAndTheMode)
{
    TEST_LIST list({"a", "b"}, SZLIST_CASE_SORTED);
    ASSERT_GE(NLIBCSzListPush(&list.p, std::string(600, 'x').c_str()), 0);
    ASSERT_EQ(list.p->nSize, 1024);
    NLIBCSzListClear(list.p);
    EXPECT_EQ(list.p->nSize, 1024);
    EXPECT_EQ(list.p->nItem, 0);
    EXPECT_EQ(list.p->nFree, 1000);
    EXPECT_EQ(list.p->EndofFree, 1024);
    EXPECT_EQ(list.p->fMode, SZLIST_CASE_SORTED);
    EXPECT_EQ(Defect(list.p), "");
}

TEST(SzListDump, PrintsAddressesAndCounts)
{
    const TEST_LIST list({"sda", "sdb"}, SZLIST_SORTED);
    const char *const pBlock = reinterpret_cast<const char *>(list.p);
    const void *const pEnd = pBlock + list.p->EndofFree;
    char szLast[160];
    const int cchLast =
        snprintf(szLast, sizeof(szLast),
                 "nSize =%i \t nItem =%i \t nFree =%i \t fMode =%i \t EndofFree=%p\n", 512, 2,
                 488 - 16, 1, pEnd);
    std::string expected;
    char szLine[160];
    (void)snprintf(szLine, sizeof(szLine), "%p start address \n",
                   static_cast<const void *>(list.p));
    expected += szLine;
    for (int i = 0; i < 2; i++) {
        (void)snprintf(szLine, sizeof(szLine), "%p ,%p pszItem[%i]=%s\n",
                       static_cast<const void *>(NLIBCSzListGet(list.p, i)),
                       static_cast<const void *>(pBlock + 24 + 4 * i), i, i == 0 ? "sda" : "sdb");
        expected += szLine;
    }
    int result = 0;
    EXPECT_EQ(StdoutOf([&] { result = NLIBCSzListDump(list.p); }), expected + szLast);
    EXPECT_EQ(result, cchLast);
}

} // namespace
