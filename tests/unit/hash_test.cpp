// SPDX-License-Identifier: MIT
#include "nurocore/hash.h"

#include "hash_walk.h"
#include "last_error.h"
#include "table.h"

#include <algorithm>
#include <climits>
#include <cstdint>

namespace
{

std::string NumberedKey(int i)
{
    return {'k', static_cast<char>('0' + i / 10), static_cast<char>('0' + i % 10)};
}

// Pairs of 3 + 1 and 1 + 1 bytes: 6 of the pool each.
void FillWithPairsOfSixBytes(TEST_HASH &hash, int nPair)
{
    for (int i = 0; i < nPair; i++) {
        ASSERT_GE(NLIBCHashSet(&hash.p, NumberedKey(i).c_str(), "v"), 0);
    }
}

struct INDEX_CASE {
    const char *szText;
    int nSlot;
    int index;
};

// Worked out by hand. Four bytes are one big-endian number; the rest is one more, its missing low
// bytes 0; the sum is taken modulo 2^32.
constexpr INDEX_CASE INDEX_CASES[] = {
    {"", 31, 0},
    {"a", 31, 2},      // 0x61000000 = 1627389952 = 31 * 52496450 + 2
    {"ab", 31, 12},    // 0x61620000 = 1633812480 = 31 * 52703628 + 12
    {"abc", 31, 29},   // 0x61626300 = 1633837824 = 31 * 52704445 + 29
    {"abcd", 31, 5},   // 0x61626364 = 1633837924 = 31 * 52704449 + 5
    {"dcba", 31, 13},  // 0x64636261 = 1684234849 = 31 * 54330156 + 13
    {"abcde", 31, 9},  // 0x61626364 + 0x65000000 = 3328336740 = 31 * 107365701 + 9
    {"abcd", 119, 54}, // 1633837924 = 119 * 13729730 + 54
    {"abcd", 1, 0},
    {"\xff\xff\xff\xff\xff", 31,
     18}, // 0x1FEFFFFFF loses its carry: 4278190079 = 31 * 138006131 + 18
    {"\xff\xff\xff\xff", INT_MAX, 1}, // 4294967295 = 2 * 2147483647 + 1
};

TEST(HashIndex, FollowsFromBigEndianGroups)
{
    for (const INDEX_CASE &row : INDEX_CASES) {
        EXPECT_EQ(NLIBCHashIndex(row.szText, row.nSlot), row.index) << row.szText;
    }
}

TEST(HashAlloc, Has31SlotsAndAPoolOf512BytesAtLeast)
{
    for (const int cbPool : {100, 0, -5, 511, 512}) {
        const TEST_HASH hash(NLIBCHashAlloc(cbPool));
        ASSERT_NE(hash.p, nullptr);
        EXPECT_EQ(hash.p->nSlot, 31);
        EXPECT_EQ(hash.p->cbPool, 512) << cbPool;
        EXPECT_EQ(hash.p->cbFree, 512) << cbPool;
        EXPECT_EQ(hash.p->nEntry, 0);
        EXPECT_EQ(Defect(hash.p), "");
    }
    EXPECT_EQ(TEST_HASH(NLIBCHashAlloc(513)).p->cbPool, 513);
}

TEST(HashAlloc, TheAllocatorTakesBothNumbersAsTheyAre)
{
    const TEST_HASH hash(NLIBCHashAllocator(7, 20));
    ASSERT_NE(hash.p, nullptr);
    EXPECT_EQ(hash.p->nSlot, 7);
    EXPECT_EQ(hash.p->cbPool, 20);
    EXPECT_EQ(hash.p->cbFree, 20);
    EXPECT_EQ(Defect(hash.p), "");
    EXPECT_EQ(TEST_HASH(NLIBCHashAllocator(7, 0)).p->cbFree, 0);
}

TEST(HashAlloc, ATableWithoutSlotsIsEmptyAndStaysSo)
{
    for (const int cbPool : {0, 512}) {
        TEST_HASH hash(NLIBCHashAllocator(0, cbPool));
        ASSERT_NE(hash.p, nullptr);
        EXPECT_EQ(hash.p->nSlot, 0);
        EXPECT_EQ(hash.p->cbFree, cbPool);
        EXPECT_QUIET(NLIBCHashSet(&hash.p, "k", "v"), -1);
        EXPECT_QUIET(NLIBCHashSet(&hash.p, "", ""), -1);
        EXPECT_QUIET(NLIBCHashGet(hash.p, "k"), nullptr);
        EXPECT_QUIET(NLIBCHashKeyListGet(hash.p, nullptr), 0);
        EXPECT_EQ(hash.p->nEntry, 0);
        EXPECT_EQ(Defect(hash.p), "");
    }
}

#if SIZE_MAX == UINT32_MAX
// A slot is 8 bytes here, the header 20: these tables need 2^32 + 532, 2^32 + 19 and 2^34 + 12
// bytes, and the low 32 bits of each are a small number.
TEST(HashAlloc, ATableLargerThanTheAddressSpaceIsNone)
{
    EXPECT_FAILS(NLIBCHashAllocator(0x20000000, 512), nullptr, ERR_OUT_OF_MEMORY);
    EXPECT_FAILS(NLIBCHashAllocator(0x10000000, INT_MAX), nullptr, ERR_OUT_OF_MEMORY);
    EXPECT_FAILS(NLIBCHashAllocator(INT_MAX, 0), nullptr, ERR_OUT_OF_MEMORY);
}
#endif

TEST(HashKeyList, FailsWithoutAListWhenThereAreKeys)
{
    TEST_HASH hash;
    PNLIBSZLIST pNone = nullptr;
    ASSERT_GE(NLIBCHashSet(&hash.p, "k", "v"), 0);
    EXPECT_FAILS(NLIBCHashKeyListGet(hash.p, &pNone), -1, ERR_BAD_PARAMETER);
}

TEST(HashSet, TellsTheSlotAndTakesTheBytes)
{
    TEST_HASH hash;
    EXPECT_QUIET(NLIBCHashSet(&hash.p, "abcd", "value"), 5);
    EXPECT_EQ(hash.p->nEntry, 1);
    EXPECT_EQ(hash.p->cbFree, 512 - 5 - 6);
    EXPECT_QUIET(NLIBCHashSet(&hash.p, "", ""), 0);
    EXPECT_EQ(hash.p->cbFree, 512 - 5 - 6 - 2);
    EXPECT_EQ(ValueOf(hash.p, "abcd"), "value");
    EXPECT_EQ(ValueOf(hash.p, ""), "");
    EXPECT_EQ(Defect(hash.p), "");
}

TEST(HashSet, KeepsCopies)
{
    TEST_HASH hash;
    char szKey[] = "sda1";
    char szValue[] = "one";
    ASSERT_GE(NLIBCHashSet(&hash.p, szKey, szValue), 0);
    szKey[3] = '2';
    szValue[0] = '0';
    EXPECT_EQ(ValueOf(hash.p, "sda1"), "one");
}

TEST(HashSet, AShorterValueReusesTheBytes)
{
    TEST_HASH hash;
    ASSERT_EQ(NLIBCHashSet(&hash.p, "abcd", "value"), 5);
    const i32 cbFree = hash.p->cbFree;
    const char *const pszStored = NLIBCHashGet(hash.p, "abcd");
    for (const char *szValue : {"other", "v", ""}) {
        EXPECT_QUIET(NLIBCHashSet(&hash.p, "abcd", szValue), 5);
        EXPECT_EQ(NLIBCHashGet(hash.p, "abcd"), pszStored);
        EXPECT_STREQ(pszStored, szValue);
    }
    EXPECT_EQ(hash.p->cbFree, cbFree);
    EXPECT_EQ(hash.p->nEntry, 1);
}

TEST(HashSet, ALongerValueTakesNewBytes)
{
    TEST_HASH hash;
    ASSERT_EQ(NLIBCHashSet(&hash.p, "abcd", "value"), 5);
    const i32 cbFree = hash.p->cbFree;
    EXPECT_QUIET(NLIBCHashSet(&hash.p, "abcd", "longer"), 5);
    EXPECT_EQ(hash.p->cbFree, cbFree - 7);
    EXPECT_EQ(hash.p->nEntry, 1);
    EXPECT_EQ(ValueOf(hash.p, "abcd"), "longer");
    EXPECT_EQ(Defect(hash.p), "");
}

// A single character c has its home at 16 * c modulo 31, because 2^5 is 1 modulo 31: 'z', '[' and
// '<' (122, 91, 60) all live at 30, 'a' at 2.
TEST(HashSet, ATakenSlotSendsOnToTheNextAndRoundTheEnd)
{
    TEST_HASH hash;
    EXPECT_EQ(NLIBCHashSet(&hash.p, "z", "1"), 30);
    EXPECT_EQ(NLIBCHashSet(&hash.p, "[", "2"), 0);
    EXPECT_EQ(NLIBCHashSet(&hash.p, "<", "3"), 1);
    EXPECT_EQ(NLIBCHashSet(&hash.p, "a", "4"), 2);
    EXPECT_EQ(NLIBCHashSet(&hash.p, "<", "5"), 1);
    EXPECT_EQ(ValueOf(hash.p, "z"), "1");
    EXPECT_EQ(ValueOf(hash.p, "["), "2");
    EXPECT_EQ(ValueOf(hash.p, "<"), "5");
    EXPECT_EQ(KeysOf(hash.p), (ITEMS{"[", "<", "a", "z"}));
}

TEST(HashSet, FailsWhenEverySlotHoldsAnotherKey)
{
    TEST_HASH hash(NLIBCHashAllocator(1, 512));
    EXPECT_QUIET(NLIBCHashSet(&hash.p, "a", "1"), 0);
    EXPECT_QUIET(NLIBCHashSet(&hash.p, "b", "2"), -1);
    EXPECT_EQ(NLIBCHashGet(hash.p, "b"), nullptr) << "a full table ends the search too";
    EXPECT_QUIET(NLIBCHashSet(&hash.p, "a", "3"), 0);
    EXPECT_EQ(ValueOf(hash.p, "a"), "3");
    EXPECT_EQ(hash.p->nEntry, 1);
}

// One slot would become 1 * 4 - 5.
TEST(HashSet, KeepsTheTableWhenItCannotGrow)
{
    TEST_HASH hash(NLIBCHashAllocator(1, 512));
    ASSERT_EQ(NLIBCHashSet(&hash.p, "a", "1"), 0);
    const PNLIBHASH pBefore = hash.p;
    EXPECT_FAILS(NLIBCHashSet(&hash.p, "a", "longer"), -1, ERR_OUT_OF_MEMORY);
    EXPECT_EQ(hash.p, pBefore);
    EXPECT_EQ(ValueOf(hash.p, "a"), "1");
    EXPECT_EQ(Defect(hash.p), "");
}

// An empty pool of 31000 slots grows by what the first pair needs for each: 70002 * 31000 is more
// than 2147483647.
TEST(HashSet, KeepsTheTableWhenThePoolWouldPass32Bits)
{
    TEST_HASH hash(NLIBCHashAllocator(31000, 512));
    ASSERT_NE(hash.p, nullptr);
    const PNLIBHASH pBefore = hash.p;
    EXPECT_FAILS(NLIBCHashSet(&hash.p, "", std::string(70000, 'v').c_str()), -1, ERR_OUT_OF_MEMORY);
    EXPECT_EQ(hash.p, pBefore);
    EXPECT_EQ(hash.p->nEntry, 0);
    EXPECT_EQ(Defect(hash.p), "");
}

// 31 slots with 23 keys: 8 / 31 is above a quarter. With 24: 7 / 31 is below. 31 * 4 - 5 is 119.
// There "abcd" lives at 54, which "k04" has taken: 0x6B303400 = 1798321152 = 119 * 15111942 + 54.
TEST(HashSet, The25thKeyOf31SlotsFinds119)
{
    TEST_HASH hash;
    FillWithPairsOfSixBytes(hash, 24);
    EXPECT_EQ(hash.p->nSlot, 31);
    EXPECT_EQ(hash.p->nEntry, 24);
    EXPECT_EQ(hash.p->cbFree, 512 - 24 * 6);
    EXPECT_QUIET(NLIBCHashSet(&hash.p, "abcd", "v"), 55);
    EXPECT_EQ(hash.p->nSlot, 119);
    EXPECT_EQ(hash.p->nEntry, 25);
    EXPECT_EQ(hash.p->cbPool, 512);
    EXPECT_EQ(hash.p->cbFree, 512 - 24 * 6 - 7);
    for (int i = 0; i < 24; i++) {
        EXPECT_EQ(ValueOf(hash.p, NumberedKey(i)), "v") << i;
    }
    EXPECT_EQ(Defect(hash.p), "");
}

// A table of nSlot slots and cbPool bytes with nPair pairs of 6 bytes, and one more value to set.
struct GROWTH_CASE {
    const char *szName;
    int nSlot;
    int cbPool;
    int nPair;
    const char *szKey;
    size_t cchValue;
    int nSlotAfter;
    i32 cbPoolAfter;
    i32 cbFreeAfter;
    int nEntryAfter;
};

constexpr GROWTH_CASE GROWTH_CASES[] = {
    // 4 slots with 3 keys: 1 / 4 is a quarter. With 4: none is free. 4 * 4 - 5 is 11.
    {"AQuarterOfTheSlotsFreeIsEnough", 4, 512, 3, "k03", 1, 4, 512, 512 - 24, 4},
    {"NoSlotFreeIsNot", 4, 512, 4, "k00", 6, 11, 512, 512 - 24 - 7, 4},
    {"AValueAsLongInACrowdedTableStays", 31, 512, 24, "k07", 1, 31, 512, 512 - 24 * 6, 24},
    {"ALongerOneFinds119SlotsToo", 31, 512, 24, "k07", 2, 119, 512, 512 - 24 * 6 - 3, 24},
    // 119 slots: 29.75 free ones are a quarter, so 90 keys (29 free) are too many and 89 (30) are
    // not.
    {"The90thKeyOf119SlotsStays", 31, 4096, 89, "k89", 1, 119, 4096, 4096 - 90 * 6, 90},
    {"The91stKeyOf119SlotsFinds471", 31, 4096, 90, "k90", 1, 471, 4096, 4096 - 91 * 6, 91},
    // n = 2 + 1 + 508 + 1 = 512 is not less than the 512 bytes that are free. The table is empty,
    // so
    // every one of the 31 unused slots counts for n: 512 + 512 * 31 + 512.
    {"AFullPoolGrowsByTheFirstPair", 31, 512, 0, "ab", 508, 31, 16896, 16896 - 512, 1},
    {"OneByteLessStays", 31, 512, 0, "ab", 507, 31, 512, 1, 1},
    // Three pairs leave 512 - 18 = 494. n = 4 + 490 = 494 does not fit; 512 / 3 = 170.67 counts as
    // 170 for each of 31 - 3 = 28 slots: 512 + 4760 + 494.
    {"APoolGrowsByTheMeanPair", 31, 512, 3, "big", 489, 31, 5766, 5766 - 18 - 494, 4},
    // 24 pairs leave 512 - 144 = 368. n = 4 + 400 = 404 does not fit, and 7 of 31 slots are too
    // few.
    // The pool counts with the old table's numbers: 512 / 24 = 21.33, so 512 + 21 * 7 + 404.
    {"SlotsAndPoolGrowTogether", 31, 512, 24, "big", 399, 119, 1063, 1063 - 144 - 404, 25},
};

TEST_ROWS(HashGrowth, GROWTH_CASES)
{
    const GROWTH_CASE &row = GetParam();
    TEST_HASH hash(NLIBCHashAllocator(row.nSlot, row.cbPool));
    FillWithPairsOfSixBytes(hash, row.nPair);
    const std::string value(row.cchValue, 'w');
    ASSERT_GE(NLIBCHashSet(&hash.p, row.szKey, value.c_str()), 0);
    EXPECT_EQ(hash.p->nSlot, row.nSlotAfter);
    EXPECT_EQ(hash.p->cbPool, row.cbPoolAfter);
    EXPECT_EQ(hash.p->cbFree, row.cbFreeAfter);
    EXPECT_EQ(hash.p->nEntry, row.nEntryAfter);
    EXPECT_EQ(ValueOf(hash.p, row.szKey), value);
    EXPECT_EQ(Defect(hash.p), "");
}

// Two pairs take 12; "k00" gets 1 + 300 new bytes and leaves 2 dead ones: 512 - 12 - 301 = 199. A
// value of 250 needs 251: 512 / 2 = 256 for each of 29 slots, 512 + 7424 + 251. The new pool holds
// 6 + (4 + 301) bytes of the old one, and then 251.
TEST(HashSet, ARebuildLeavesDeadBytesBehind)
{
    TEST_HASH hash;
    FillWithPairsOfSixBytes(hash, 2);
    ASSERT_GE(NLIBCHashSet(&hash.p, "k00", std::string(300, 'v').c_str()), 0);
    EXPECT_EQ(hash.p->cbFree, 199);
    ASSERT_GE(NLIBCHashSet(&hash.p, "k01", std::string(250, 'w').c_str()), 0);
    EXPECT_EQ(hash.p->cbPool, 8187);
    EXPECT_EQ(hash.p->cbFree, 8187 - 6 - 305 - 251);
    EXPECT_EQ(ValueOf(hash.p, "k00"), std::string(300, 'v'));
    EXPECT_EQ(ValueOf(hash.p, "k01"), std::string(250, 'w'));
}

// The mean is taken in single precision, where 16777217 is 16777216: the pool of 2 slots grows to
// 16777217 + 16777216 * 1 + n, with n = 16777213 after a pair of 4 bytes.
TEST(HashSet, TheMeanPairIsASinglePrecisionNumber)
{
    TEST_HASH hash(NLIBCHashAllocator(2, 16777217));
    ASSERT_NE(hash.p, nullptr);
    ASSERT_GE(NLIBCHashSet(&hash.p, "k", "v"), 0);
    ASSERT_EQ(hash.p->cbFree, 16777213);
    ASSERT_GE(NLIBCHashSet(&hash.p, "k", std::string(16777212, 'v').c_str()), 0);
    EXPECT_EQ(hash.p->cbPool, 50331646);
    EXPECT_EQ(hash.p->nSlot, 2);
}

TEST(HashSet, TakesKeyAndValueOfTheTableItself)
{
    const FREED_MEMORY_SCOPE overwritten;
    TEST_HASH hash;
    const std::string text(100, 't');
    ASSERT_GE(NLIBCHashSet(&hash.p, "source", text.c_str()), 0);
    for (int i = 0; i < 40; i++) { // through several rebuilds
        ASSERT_GE(NLIBCHashSet(&hash.p, NumberedKey(i).c_str(), NLIBCHashGet(hash.p, "source")), 0);
        ASSERT_EQ(ValueOf(hash.p, NumberedKey(i)), text);
    }
    ASSERT_GE(NLIBCHashSet(&hash.p, NLIBCHashGet(hash.p, "source"), "key"), 0);
    EXPECT_EQ(ValueOf(hash.p, text), "key");
    ASSERT_GE(NLIBCHashSet(&hash.p, "source", NLIBCHashGet(hash.p, "source") + 90), 0);
    EXPECT_EQ(ValueOf(hash.p, "source"), std::string(10, 't'));
    EXPECT_EQ(Defect(hash.p), "");
}

TEST(HashGet, ComparesKeysExactly)
{
    TEST_HASH hash;
    ASSERT_GE(NLIBCHashSet(&hash.p, "/dev/sda1", "uuid"), 0);
    EXPECT_EQ(ValueOf(hash.p, "/dev/sda1"), "uuid");
    for (const char *szKey : {"/dev/sda", "/dev/sda12", "/DEV/SDA1", "", "sda1"}) {
        EXPECT_QUIET(NLIBCHashGet(hash.p, szKey), nullptr);
    }
}

TEST(HashKeyList, OfAnEmptyTableLeavesTheList)
{
    const TEST_HASH hash;
    TEST_LIST list({"before"}, SZLIST_UNSORTED);
    EXPECT_QUIET(NLIBCHashKeyListGet(hash.p, &list.p), 0);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"before"}));
    EXPECT_QUIET(NLIBCHashKeyListGet(hash.p, nullptr), 0);
}

// Homes of 31: "abcd" 5, "abcde" 9, "dcba" 13, "abc" 29.
TEST(HashKeyList, AppendsInSlotOrder)
{
    TEST_HASH hash;
    for (const char *szKey : {"abc", "dcba", "abcde", "abcd"}) {
        ASSERT_GE(NLIBCHashSet(&hash.p, szKey, "v"), 0);
    }
    TEST_LIST list({"before"}, SZLIST_UNSORTED);
    EXPECT_QUIET(NLIBCHashKeyListGet(hash.p, &list.p), 4);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"before", "abcd", "abcde", "dcba", "abc"}));
    EXPECT_QUIET(NLIBCHashKeyListGet(hash.p, nullptr), 4);
}

// Rebuilding visits the old slots in index order. Of 31 slots "z" lives at 30 and "[", which came
// later, at 0; of 119 slots 'z' << 24 lives at 3 and '[' << 24 at 91 (2046820352 = 119 * 17200171 +
// 3, 1526726656 = 119 * 12829635 + 91), and "<" at 60 (1006632960 = 119 * 8459100 + 60).
TEST(HashKeyList, FollowsTheNewSlotsAfterARebuild)
{
    TEST_HASH hash;
    for (const char *szKey : {"z", "[", "<"}) {
        ASSERT_GE(NLIBCHashSet(&hash.p, szKey, "v"), 0);
    }
    EXPECT_EQ(KeysOf(hash.p), (ITEMS{"[", "<", "z"}));
    FillWithPairsOfSixBytes(hash, 22);
    ASSERT_EQ(hash.p->nSlot, 119);
    ITEMS keys = KeysOf(hash.p);
    std::erase_if(keys, [](const std::string &key) { return key.size() > 1; });
    EXPECT_EQ(keys, (ITEMS{"z", "<", "["}));
}

TEST(HashRandom, TellsTheSameAsAMap)
{
    std::mt19937 random(20080516);
    for (int nRound = 0; nRound < 10; nRound++) {
        ASSERT_EQ(HashWalk(RandomBytes(random, 5200)), "") << "round " << nRound;
    }
}

} // namespace
