// SPDX-License-Identifier: MIT
#include "nurocore/text.h"

#include "last_error.h"
#include "test_szlist.h"

#include <climits>
#include <cstring>
#include <string>
#include <string_view>

namespace
{

using std::literals::operator""sv;

struct TRIM_CASE {
    const char *szText;
    const char *szTrimmed;
};

constexpr TRIM_CASE TRIM_CASES[] = {
    {"", ""},
    {"word", "word"},
    {"  word\t", "word"},
    {" \t\r\n two words \n\r\t ", "two words"},
    {" \t\r\n ", ""},
    {" ", ""},
    {"x", "x"},
    {" x ", "x"},
    // white space is these four alone
    {"\vword\f", "\vword\f"},
    {" \v ", "\v"},
    {"\f", "\f"},
    // one pair of enclosing quotes
    {"\"word\"", "word"},
    {" \t\"word\" \t", "word"},
    {"\"word", "\"word"},
    {"word\"", "word\""},
    {"\"", "\""},
    {" \" ", "\""},
    {"\"\"", ""},
    {"\"\"\"", "\""},
    {"\"\"word\"\"", "\"word\""},
    {"\"one\" \"two\"", "one\" \"two"},
    {"\" word \"", " word "}, // what the quotes enclose is kept
    {"'word'", "'word'"},
};

// Quotes are dropped where they stand on both sides, and are left out here.
TEST(StrTrimSpace, TakesFourBytesForBlankAndNoOther)
{
    for (int byte = 1; byte < 256; byte++) {
        const char ch = static_cast<char>(byte);
        const bool fBlank = ch == ' ' || ch == '\t' || ch == '\n' || ch == '\r';
        char sz[] = {ch, 'x', ch, '\0'};
        const std::string szWhole = sz;
        if (ch != '"') {
            EXPECT_EQ(NLIBCStrTrimSpace(sz, nullptr), fBlank ? 1 : 3) << byte;
            EXPECT_EQ(sz, fBlank ? "x" : szWhole) << byte;
        }
    }
}

TEST(StrTrimSpace, InPlaceAndIntoAnotherBuffer)
{
    for (const TRIM_CASE &row : TRIM_CASES) {
        SCOPED_TRACE(row.szText);
        const int cch = static_cast<int>(strlen(row.szTrimmed));
        char szInPlace[32];
        (void)snprintf(szInPlace, sizeof(szInPlace), "%s", row.szText);
        EXPECT_QUIET(NLIBCStrTrimSpace(szInPlace, nullptr), cch);
        EXPECT_STREQ(szInPlace, row.szTrimmed);

        (void)snprintf(szInPlace, sizeof(szInPlace), "%s", row.szText);
        EXPECT_QUIET(NLIBCStrTrimSpace(szInPlace, szInPlace), cch);
        EXPECT_STREQ(szInPlace, row.szTrimmed);

        char szSource[32];
        (void)snprintf(szSource, sizeof(szSource), "%s", row.szText);
        char szOther[32] = "untouched";
        EXPECT_QUIET(NLIBCStrTrimSpace(szSource, szOther), cch);
        EXPECT_STREQ(szOther, row.szTrimmed);
        EXPECT_STREQ(szSource, row.szText) << "the source stays";
    }
}

TEST(StrTrimSpace, WritesNothingBehindTheSizeOfTheSource)
{
    char szSource[] = " ab ";
    char szOther[] = "XXXXXX";
    EXPECT_EQ(NLIBCStrTrimSpace(szSource, szOther), 2);
    EXPECT_EQ(szOther[5], 'X');
    EXPECT_STREQ(szOther, "ab");
}

TEST(StrTrimSpace, RefusesADestinationInsideTheSource)
{
    char szText[8] = " ab ";
    for (int i = 1; i <= 4; i++) { // 4 is the terminator
        EXPECT_FAILS(NLIBCStrTrimSpace(szText, szText + i), -1, ERR_BAD_PARAMETER);
        EXPECT_STREQ(szText, " ab ");
    }
    EXPECT_QUIET(NLIBCStrTrimSpace(szText, szText + 5), 2); // 3 bytes are left there
    EXPECT_STREQ(szText + 5, "ab");
}

TEST(StrTrimSpace, AllowsADestinationBeforeTheSource)
{
    char szText[16] = "XXXX  ab ";
    EXPECT_QUIET(NLIBCStrTrimSpace(szText + 4, szText), 2);
    EXPECT_STREQ(szText, "ab");
}

ITEMS FieldsOf(const char *szText, const char *szDelims)
{
    std::string copy = szText;
    char *pszCursor = copy.data();
    ITEMS fields;
    while (const char *const pszField = NLIBCStrSepNonEmpty(&pszCursor, szDelims)) {
        fields.emplace_back(pszField);
    }
    EXPECT_EQ(pszCursor, nullptr) << "the cursor ends as NULL";
    return fields;
}

TEST(StrSepNonEmpty, SkipsEmptyFields)
{
    EXPECT_EQ(FieldsOf("a,b", ","), (ITEMS{"a", "b"}));
    EXPECT_EQ(FieldsOf("a,,b", ","), (ITEMS{"a", "b"}));
    EXPECT_EQ(FieldsOf(",,a,b,,", ","), (ITEMS{"a", "b"}));
    EXPECT_EQ(FieldsOf("a b\tc \t", " \t"), (ITEMS{"a", "b", "c"}));
    EXPECT_EQ(FieldsOf("word", ","), (ITEMS{"word"}));
    EXPECT_EQ(FieldsOf("word", ""), (ITEMS{"word"}));
    EXPECT_EQ(FieldsOf(",,,", ","), (ITEMS{}));
    EXPECT_EQ(FieldsOf("", ","), (ITEMS{}));
}

TEST(StrSepNonEmpty, EndsTheFieldAndMovesTheCursorBehindIt)
{
    char szText[] = "key=value";
    char *pszCursor = szText;
    EXPECT_EQ(NLIBCStrSepNonEmpty(&pszCursor, "="), szText);
    EXPECT_STREQ(szText, "key");
    EXPECT_EQ(pszCursor, szText + 4);
    EXPECT_STREQ(NLIBCStrSepNonEmpty(&pszCursor, "="), "value");
    EXPECT_EQ(pszCursor, nullptr);
}

TEST(StrTok, PushesTheFieldsOfACopy)
{
    TEST_LIST list({"before"}, SZLIST_UNSORTED);
    const char szText[] = "a,,b";
    EXPECT_QUIET(NLIBCStrTok(szText, ",", &list.p), 2);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"before", "a", "b"}));
    EXPECT_STREQ(szText, "a,,b");
    EXPECT_QUIET(NLIBCStrTok(" x\ty ", " \t", &list.p), 2);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"before", "a", "b", "x", "y"}));
}

TEST(StrTok, OfSeparatorsAloneLeavesTheList)
{
    TEST_LIST list({"before"}, SZLIST_UNSORTED);
    EXPECT_QUIET(NLIBCStrTok(",,,", ",", &list.p), 0);
    EXPECT_QUIET(NLIBCStrTok("", ",", &list.p), 0);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"before"}));
}

TEST(StrTok, GrowsTheCallersList)
{
    TEST_LIST list(512);
    std::string text;
    for (int i = 0; i < 200; i++) {
        text += std::to_string(1000 + i) + " ";
    }
    EXPECT_QUIET(NLIBCStrTok(text.c_str(), " ", &list.p), 200);
    EXPECT_EQ(list.p->nItem, 200);
    EXPECT_EQ(list.p->nSize, 2048); // 200 * 9 bytes and 24
    EXPECT_STREQ(NLIBCSzListGet(list.p, 199), "1199");
}

TEST(StrTok, SplitsAStringOfTheListItself)
{
    TEST_LIST list({"a b"}, SZLIST_UNSORTED);
    EXPECT_QUIET(NLIBCStrTok(NLIBCSzListGet(list.p, 0), " ", &list.p), 2);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"a b", "a", "b"}));
}

// Eight bytes of memory before and after; cbText of them are the buffer, and what lies behind it
// must stay.
struct APPEND_CASE {
    std::string_view before;
    size_t cbText;
    const char *szMore;
    std::string_view cut;   // after NLIBCStrAppend
    size_t cchCut;          // what it returns
    std::string_view whole; // after NLIBCStrAppendWhole
    int fWhole;             // what it returns
};

constexpr APPEND_CASE APPEND_CASES[] = {
    {"ab\0#####"sv, 8, "cd", "abcd\0###"sv, 4, "abcd\0###"sv, 1},
    // fits exactly, one byte short, full
    {"ab\0#####"sv, 5, "cd", "abcd\0###"sv, 4, "abcd\0###"sv, 1},
    {"ab\0#####"sv, 4, "cd", "abc\0####"sv, 3, "ab\0#####"sv, 0},
    {"ab\0#####"sv, 3, "cd", "ab\0#####"sv, 2, "ab\0#####"sv, 0},
    // to an empty text
    {"\0#######"sv, 5, "abcd", "abcd\0###"sv, 4, "abcd\0###"sv, 1},
    {"\0#######"sv, 4, "abcd", "abc\0####"sv, 3, "\0#######"sv, 0},
    {"\0#######"sv, 1, "a", "\0#######"sv, 0, "\0#######"sv, 0},
    // an empty text fits wherever there is a terminator
    {"ab\0#####"sv, 8, "", "ab\0#####"sv, 2, "ab\0#####"sv, 1},
    {"ab\0#####"sv, 3, "", "ab\0#####"sv, 2, "ab\0#####"sv, 1},
    // no buffer, and one whose text has no end
    {"########"sv, 0, "a", "########"sv, 0, "########"sv, 0},
    {"########"sv, 0, "", "########"sv, 0, "########"sv, 0},
    {"ab######"sv, 2, "cd", "ab######"sv, 2, "ab######"sv, 0},
};

TEST(StrAppend, CutsAtTheEndOfTheBuffer)
{
    for (const APPEND_CASE &row : APPEND_CASES) {
        std::string bytes(row.before);
        EXPECT_EQ(NLIBCStrAppend(bytes.data(), row.cbText, row.szMore), row.cchCut);
        EXPECT_EQ(bytes, row.cut) << row.cbText << " bytes and " << row.szMore;
    }
}

TEST(StrAppendWhole, AppendsAllOrNothing)
{
    for (const APPEND_CASE &row : APPEND_CASES) {
        std::string bytes(row.before);
        EXPECT_EQ(NLIBCStrAppendWhole(bytes.data(), row.cbText, row.szMore), row.fWhole);
        EXPECT_EQ(bytes, row.whole) << row.cbText << " bytes and " << row.szMore;
    }
}

TEST(StrToI32, ClampsTo32Bits)
{
    struct CASE {
        const char *szText;
        i32 value;
    };
    constexpr CASE CASES[] = {
        {"0", 0},
        {"42", 42},
        {"-7", -7},
        {"+5", 5},
        {" \t12", 12},
        {"12 disks", 12},
        {"0x10", 0},
        {"010", 10},
        {"", 0},
        {"none", 0},
        {"2147483647", INT_MAX},
        {"2147483648", INT_MAX},
        {"4294967297", INT_MAX},
        {"99999999999999999999999", INT_MAX},
        {"-2147483648", INT_MIN},
        {"-2147483649", INT_MIN},
        {"-99999999999999999999999", INT_MIN},
    };
    for (const CASE &row : CASES) {
        EXPECT_EQ(NLIBCStrToI32(row.szText), row.value) << row.szText;
    }
}

} // namespace
