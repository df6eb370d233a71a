// SPDX-License-Identifier: MIT
#include "nurocore/szlist.h"

#include "last_error.h"
#include "szlist_walk.h"
#include "table.h"
#include "test_files.h"

#include <climits>
#include <cstdio>
#include <functional>

namespace
{

// ---- steps on a list, and what each of them leaves ----------------------------------------------

using STEP = std::function<void(TEST_LIST &)>;

STEP Of(const ITEMS &items, int fMode = SZLIST_UNSORTED)
{
    return [=](TEST_LIST &list) {
        TEST_LIST fresh(items, fMode);
        std::swap(list.p, fresh.p);
    };
}

STEP Push(const std::string &item, int result)
{
    return [=](TEST_LIST &list) { EXPECT_QUIET(NLIBCSzListPush(&list.p, item.c_str()), result); };
}

STEP PushHead(const char *szItem, int result)
{
    return [=](TEST_LIST &list) { EXPECT_QUIET(NLIBCSzListPushHead(&list.p, szItem), result); };
}

STEP Insert(int index, const char *szItem, int result)
{
    return
        [=](TEST_LIST &list) { EXPECT_QUIET(NLIBCSzListInsert(&list.p, index, szItem), result); };
}

STEP Set(int index, const char *szItem, int result, u32 code = OLD_CODE)
{
    return [=](TEST_LIST &list) {
        EXPECT_FAILS(NLIBCSzListSet(&list.p, index, szItem), result, code);
    };
}

STEP Find(const char *szItem, int result)
{
    return [=](TEST_LIST &list) { EXPECT_QUIET(NLIBCSzListFind(list.p, szItem), result); };
}

STEP CaseFind(const char *szItem, int result)
{
    return [=](TEST_LIST &list) { EXPECT_QUIET(NLIBCSzListCaseFind(list.p, szItem), result); };
}

// The bytes of what is removed stay in the block.
STEP Remove(int index, const std::string &item)
{
    return [=](TEST_LIST &list) { EXPECT_QUIET(NLIBCSzListRemove(list.p, index), item); };
}

STEP Sort(int fMode)
{
    return [=](TEST_LIST &list) {
        EXPECT_QUIET((NLIBCSzListSort(list.p, fMode), list.p->fMode), fMode);
    };
}

STEP Mode(int fMode)
{
    return [=](TEST_LIST &list) { EXPECT_EQ(list.p->fMode, fMode); };
}

STEP Items(const ITEMS &items)
{
    return [=](TEST_LIST &list) { EXPECT_EQ(ItemsOf(list.p), items); };
}

// The block's size, its free bytes and where its strings begin.
STEP Block(i32 nSize, i32 nFree, i32 endOfFree)
{
    return [=](TEST_LIST &list) {
        EXPECT_EQ(list.p->nSize, nSize);
        EXPECT_EQ(list.p->nFree, nFree);
        EXPECT_EQ(list.p->EndofFree, endOfFree);
    };
}

STEP Slot(int index, i32 offset)
{
    return [=](TEST_LIST &list) { EXPECT_EQ(SlotOf(list.p, index), offset); };
}

// An empty slot is told as an empty text.
STEP Empty(const std::vector<int> &slots)
{
    return [=](TEST_LIST &list) {
        std::vector<int> found;
        for (int i = 0; i < list.p->nItem; i++) {
            if (IsEmptySlot(list.p, i)) {
                EXPECT_QUIET(NLIBCSzListGet(list.p, i), std::string());
                found.push_back(i);
            }
        }
        EXPECT_EQ(found, slots);
    };
}

const STEP COMPACT = [](TEST_LIST &list) { NLIBCSzListCompact(list.p); };
const STEP CLEAR = [](TEST_LIST &list) { NLIBCSzListClear(list.p); };
const STEP EXPAND = [](TEST_LIST &list) { list.p = NLIBCSzListExpand(list.p); };

constexpr int NO_ORDER = 2;
constexpr int BYTES = SZLIST_SORTED;
constexpr int NOCASE = SZLIST_CASE_SORTED;

struct LIST_CASE {
    const char *szName;
    std::vector<STEP> steps; // on a block of 512 bytes, 488 of them free
};

const LIST_CASE LIST_CASES[] = {
    // 3000 characters need 3005 bytes; 488, 1000 and 2024 do not hold them, 4072 do.
    {"PushDoublesUntilALongStringFits",
     {Of({"first"}), Push(std::string(3000, 'x'), 1),
      Block(4096, 4072 - 10 - 3005, 4096 - 6 - 3001), Items({"first", std::string(3000, 'x')})}},
    {"PushHeadInsertsBeforeTheFirst", {PushHead("b", 0), PushHead("a", 0), Items({"a", "b"})}},
    // One character, its end and one slot.
    {"InsertMovesWhatFollowsUp",
     {Of({"a", "c", "d"}), Block(512, 470, 506), Insert(1, "b", 1), Block(512, 464, 504),
      Items({"a", "b", "c", "d"})}},
    {"InsertLeavesEmptySlotsBeforeAnIndexBeyondTheEnd",
     {Insert(5, "six", 5), Block(512, 488 - 6 * 4 - 4, 508), Empty({0, 1, 2, 3, 4}), Find("", -1),
      CaseFind("", -1), Find("six", 5), Items({"", "", "", "", "", "six"})}},
    {"InsertedEmptySlotsSurviveGrowth",
     {Insert(2, "third", 2), Push(std::string(600, 'z'), 3), Block(1024, 377, 417), Empty({0, 1}),
      Items({"", "", "third", std::string(600, 'z')})}},
    {"AnEmptyStringIsAnItem", {Of({"a", ""}), Find("", 1), COMPACT, Items({"a", ""})}},
    // Its only byte is the block's last one, and that is how an empty slot is told.
    {"AnEmptyStringThatIsStoredFirstIsAnEmptySlot",
     {Of({"", "a"}), Empty({0}), Find("", -1), COMPACT, Items({"a"})}},
    {"ASortedListChoosesThePlace",
     {Of({}, BYTES), Insert(99, "m", 0), Insert(0, "z", 1), Push("a", 0), PushHead("p", 2),
      Push("Z", 0), Items({"Z", "a", "m", "p", "z"})}},
    {"ADuplicateGoesWhereTheSearchHitsItsEqual",
     {Of({"a", "b", "c"}, BYTES), Push("c", 2), Push("b", 1), Items({"a", "b", "b", "c", "c"})}},
    // And puts an item before its equal.
    {"ACaseSortedListOrdersWithoutCase",
     {Of({}, NOCASE), Push("m", 0), Push("Z", 1), Push("A", 0), Push("a", 0),
      Items({"a", "A", "m", "Z"})}},
    {"AModeThatIsNoOrderTakesTheIndex",
     {Of({"c", "a"}, NO_ORDER), Insert(1, "b", 1), Items({"c", "b", "a"})}},
    {"FindTellsTheFirstEqualItemOfAnUnsortedList",
     {Of({"sdb", "sda", "SDA", "sda"}), Find("sda", 1), Find("SDA", 2), Find("sd", -1),
      Find("", -1), CaseFind("SDa", 1), CaseFind("sdc", -1)}},
    {"FindSearchesASortedListByHalves",
     {Of({"a", "c", "e", "g", "i"}, BYTES), Find("a", 0), Find("c", 1), Find("e", 2), Find("g", 3),
      Find("i", 4), Find("", -1), Find("A", -1), Find("b", -1), Find("d", -1), Find("f", -1),
      Find("h", -1), Find("j", -1), Find("aa", -1)}},
    {"FindInASortedListWithoutItems", {Of({}, BYTES), Find("a", -1)}},
    {"FindInACaseSortedListWithoutItems", {Of({}, NOCASE), CaseFind("a", -1)}},
    // Halving would look for "a" before "b" and for "c" behind it.
    {"FindSearchesAModeThatIsNoOrderFromTheStart",
     {Of({"c", "b", "a"}, NO_ORDER), Find("a", 2), Find("b", 1), Find("c", 0), Find("d", -1),
      CaseFind("a", 2), CaseFind("b", 1), CaseFind("c", 0), CaseFind("d", -1)}},
    // The middle of 0..3 is 1, the middle of 0..2 is 1, the middle of 0..4 is 2.
    {"FindHitsTheMiddleOf4", {Of({"a", "b", "b", "b"}, BYTES), Find("b", 1)}},
    {"FindHitsTheMiddleOf3", {Of({"b", "b", "b"}, BYTES), Find("b", 1)}},
    {"FindHitsTheMiddleOf5", {Of({"b", "b", "b", "b", "b"}, BYTES), Find("b", 2)}},
    {"CaseFindHitsTheMiddleOf3", {Of({"b", "B", "b"}, NOCASE), CaseFind("B", 1)}},
    // 'a' is two before 'c', the middle of five: the search gives up there although item 0 is
    // equal.
    {"CaseFindGivesUpAtALetterTwoPlacesFurther",
     {Of({"a", "b", "c", "d", "e"}, NOCASE), CaseFind("a", -1), CaseFind("A", -1), CaseFind("b", 1),
      CaseFind("e", 4)}},
    {"FindDoesNotGiveUp", {Of({"a", "b", "c", "d", "e"}, BYTES), Find("a", 0)}},
    // Lower-cased bytes count: 'X' is two before 'z', and '_' is two before 'A'.
    {"CaseFindDoesNotGiveUpAtTheItemItself", {Of({"x", "Z"}, NOCASE), CaseFind("X", 0)}},
    {"CaseFindGivesUpAtALowerCasedLetter", {Of({"X", "z", "z"}, NOCASE), CaseFind("x", -1)}},
    {"CaseFindGivesUpAtAnUnderscore", {Of({"_", "A", "b"}, NOCASE), CaseFind("_", -1)}},
    // The middle of three is 'd', and 'b' is two before it: the low bound at that moment is 0.
    {"AnInsertionThatGivesUpGoesToTheLowBound",
     {Of({"a", "d", "e"}, NOCASE), Push("b", 0), Items({"b", "a", "d", "e"})}},
    {"AnInsertionThatGivesUpGoesBeforeItsEqual",
     {Of({"a", "b", "c", "d", "e"}, NOCASE), Push("A", 0), Items({"A", "a", "b", "c", "d", "e"})}},
    // After 'c' in the middle the low bound is 3; there 'd' is two before 'f'.
    {"AnInsertionThatGivesUpLaterGoesToTheLaterLowBound",
     {Of({"a", "b", "c", "f", "g"}, NOCASE), Push("d", 3), Items({"a", "b", "c", "d", "f", "g"})}},
    {"RemoveClosesTheGapAndGivesFourBytesBack",
     {Of({"a", "b", "c"}), Block(512, 470, 506), Remove(1, "b"), Block(512, 474, 506),
      Items({"a", "c"})}},
    {"RemoveOfTheLastItemGivesTheSlotBackButNotTheBytes",
     {Of({"abc"}), Remove(0, "abc"), Block(512, 484, 508), Items({}), Push("def", 0),
      Block(512, 476, 504), Items({"def"})}},
    // Packed downward in slot order.
    {"ExpandDoublesTheBlockAndDropsDeadBytes",
     {Of({"abcd", "efgh", "ijkl"}, BYTES), Remove(1, "efgh"), EXPAND,
      Block(1024, 1000 - 2 * 9, 1024 - 2 * 5), Slot(0, 1024 - 5), Slot(1, 1024 - 10), Mode(BYTES),
      Items({"abcd", "ijkl"})}},
    // Growing stores the strings anew in slot order, and the first one ends in the block's last
    // byte.
    {"ExpandTurnsAnEmptyStringThatIsTheFirstOneIntoAnEmptySlot",
     {Of({"a"}), PushHead("", 0), Push("", 2), Find("", 0), EXPAND, Empty({0}), Find("", 2),
      Items({"", "a", ""})}},
    // Slot 0 is skipped, so the empty string in slot 1 is the first one.
    {"ExpandTurnsAnEmptyStringBehindSkippedSlotsIntoOneToo",
     {Insert(1, "a", 1), Insert(1, "", 1), Find("", 1), EXPAND, Empty({0, 1}), Find("", -1),
      Items({"", "", "a"})}},
    {"SetCopiesAShorterStringOverTheOld",
     {Of({"abc", "def"}), Slot(0, 508), Set(0, "xyz", 0), Set(0, "q", 0), Slot(0, 508),
      Block(512, 472, 504), Items({"q", "def"})}},
    {"SetTakesNewBytesForALongerString",
     {Of({"abc", "def"}), Block(512, 472, 504), Set(1, "longer", 1), Block(512, 465, 497),
      Slot(1, 497), Items({"abc", "longer"})}},
    {"SetFillsAnEmptySlotAndKeepsTheBlocksLastByte",
     {Insert(2, "last", 2), Set(0, "", 0), Empty({0, 1}), Set(1, "x", 1), Empty({0}),
      Items({"", "x", "last"})}},
    {"SetSortsASortedListAgainAndTellsTheNewPlace",
     {Of({"b", "d", "f"}, BYTES), Set(0, "e", 1), Items({"d", "e", "f"}), Set(2, "another", 0),
      Items({"another", "d", "e"})}},
    {"SetOfACaseSortedListIsMadeAndReportedAsAFailure",
     {Of({"b", "d", "f"}, NOCASE), Set(0, "E", -1, ERR_BAD_PARAMETER), Items({"d", "E", "f"})}},
    {"SortByBytes",
     {Of({"sdb", "SDC", "sda", "sd"}), Sort(BYTES), Items({"SDC", "sd", "sda", "sdb"})}},
    {"SortTakesBytesAsUnsigned",
     {Of({"\xE9t\xE9", "zoo"}), Sort(BYTES), Items({"zoo", "\xE9t\xE9"}), Sort(SZLIST_UNSORTED),
      Sort(NOCASE), Items({"zoo", "\xE9t\xE9"})}},
    {"SortWithoutCaseKeepsTheOrderOfEquals",
     {Of({"b", "C", "B", "a", "c", "A"}), Sort(NOCASE), Items({"a", "A", "b", "B", "C", "c"})}},
    // '_' lies between the upper and the lower letters: only lower-casing puts it before both.
    {"SortWithoutCaseComparesLowerCase",
     {Of({"B", "_", "a"}), Sort(NOCASE), Items({"_", "a", "B"})}},
    {"SortGoesByTheLowBit", {Of({"a", "B"}), Sort(17), Items({"B", "a"})}},
    {"SortToNoOrderOnlyCompacts",
     {Insert(1, "b", 1), Push("a", 2), Sort(NO_ORDER), Block(512, 476, 508), Items({"b", "a"})}},
    {"SortToUnsortedOnlyCompacts",
     {Insert(1, "b", 1), Push("a", 2), Sort(SZLIST_UNSORTED), Block(512, 476, 508),
      Items({"b", "a"})}},
    {"SortFromOneOrderToAnotherOnlyStoresTheMode",
     {Of({"a", "B"}, BYTES), Sort(NOCASE), Sort(BYTES), Sort(NOCASE), Sort(0), Items({"B", "a"})}},
    {"CompactDropsTheEmptySlots",
     {Insert(2, "a", 2), Insert(5, "b", 5), Block(512, 460, 508), COMPACT,
      Block(512, 460 + 4 * 4, 508), Items({"a", "b"}), COMPACT, Items({"a", "b"})}},
    {"ClearKeepsTheBlockAndTheMode",
     {Of({"a", "b"}, NOCASE), Push(std::string(600, 'x'), 2), CLEAR, Block(1024, 1000, 1024),
      Mode(NOCASE), Items({})}},
};

TEST_ROWS(SzList, LIST_CASES)
{
    const std::vector<STEP> &steps = GetParam().steps;
    TEST_LIST list;
    for (size_t i = 0; i < steps.size(); i++) {
        SCOPED_TRACE(testing::Message() << "step " << i);
        steps[i](list);
        EXPECT_EQ(Defect(list.p), "");
    }
}

// ---- what a table does not hold -----------------------------------------------------------------

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

TEST(SzListSet, TakesAPartOfTheStringItReplaces)
{
    TEST_LIST list({"/dev/sda"}, SZLIST_UNSORTED);
    EXPECT_QUIET(NLIBCSzListSet(&list.p, 0, NLIBCSzListGet(list.p, 0) + 5), 0);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"sda"}));
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

// Thousands of random operations on a list and on a plain vector.
TEST(SzListRandom, TellsTheSameAsAVector)
{
    std::mt19937 random(20080516);
    for (int nRound = 0; nRound < 20; nRound++) {
        ASSERT_EQ(SzListWalk(RandomBytes(random, 2600)), "") << "round " << nRound;
    }
}

} // namespace
