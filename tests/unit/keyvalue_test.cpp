// SPDX-License-Identifier: MIT
#include "nurocore/keyvalue.h"

#include "last_error.h"
#include "table.h"
#include "test_files.h"

#include <algorithm>
#include <climits>
#include <cstring>
#include <vector>

namespace
{

struct MATCH_CASE {
    const char *szLine;
    const char *szKey;
    int result;
};

constexpr MATCH_CASE MATCH_CASES[] = {
    {"maxdisks=4", "maxdisks", 1},
    {"maxdisks=4\n", "maxdisks", 1},
    {"maxdisks = \"4\"\n", "maxdisks", 1},
    {" \tmaxdisks\r=4", "maxdisks", 1},
    {"\"maxdisks\"=4", "maxdisks", 1},
    {" \"max disks\" =4", "max disks", 1},
    {"maxdisks=", "maxdisks", 1},
    {"maxdisks\n", "maxdisks", 1}, // no "=": the whole line is the key
    {"maxdisks", "maxdisks", 1},
    {"=maxdisks", "maxdisks", 1}, // the empty field before it is skipped
    {"==maxdisks=4", "maxdisks", 1},
    {"key=a=b", "key", 1},
    {"!$%&()*+,-./:<>?@[]^_`{|}~=4", "!$%&()*+,-./:<>?@[]^_`{|}~", 1},
    // another key
    {"maxdisks=4", "maxdisk", 0},
    {"~maxdisks=4", "maxdisks", 0},
    {"maxdisk=4", "maxdisks", 0},
    {"Maxdisks=4", "maxdisks", 0},
    {"other=maxdisks", "maxdisks", 0},
    {"\vmaxdisks=4", "maxdisks", 0}, // not white space here
    {"maxdisks\f=4", "maxdisks", 0},
    {"\"maxdisks=4", "maxdisks", 0},
    {"", "maxdisks", 0},
    {"\n", "maxdisks", 0},
    {"=", "maxdisks", 0},
    // comments
    {"#maxdisks=4", "maxdisks", 0},
    {"#maxdisks=4", "#maxdisks", 0},
    {";maxdisks=4", "maxdisks", 0},
    {";maxdisks=4", ";maxdisks", 0},
    {" #maxdisks=4", "#maxdisks", 1},
    {" ;maxdisks=4", ";maxdisks", 1},
    {"maxdisks#=4", "maxdisks#", 1},
};

TEST(FileLineKeyMatch, ComparesTheTrimmedKey)
{
    for (const MATCH_CASE &row : MATCH_CASES) {
        SCOPED_TRACE(row.szLine);
        EXPECT_QUIET(NLIBCFileLineKeyMatch(row.szLine, row.szKey), row.result);
    }
}

TEST(FileLineKeyMatch, LeavesTheLine)
{
    const std::string line = "  maxdisks  =  \"4\"  \n";
    EXPECT_EQ(NLIBCFileLineKeyMatch(line.c_str(), "maxdisks"), 1);
    EXPECT_EQ(line, "  maxdisks  =  \"4\"  \n");
}

struct VALUE_CASE {
    const char *szText;
    const char *szValue; // NULL: no line gives the key "k" a value
};

constexpr VALUE_CASE FIRST_MATCH_CASES[] = {
    {"k=v\n", "v"},
    {"k=v", "v"}, // no line end
    {" k = \"4\" \n", "4"},
    {"k=v\r\n", "v"},
    {"k=a=b\n", "a=b"},
    {"k=!#$%&()*+,-./:;<>?@[]^_`{|}~\n", "!#$%&()*+,-./:;<>?@[]^_`{|}~"},
    {"k==v\n", "=v"},
    {"=k=v\n", "v"},
    {"k=\t two words \n", "two words"},
    {"k=\"a \"b\" c\"\n", "a \"b\" c"},
    {"k=\"\"v\"\"\n", "\"v\""},
    {"k=\"v\n", "\"v"},
    {"k=\"\n", "\""},
    {"k=v # not a comment\n", "v # not a comment"},
    {"k=\vv\f\n", "\vv\f"},
    {"# k=1\n#k=2\n;k=3\nx=4\n\n\nK=5\nk=6\nk=7\n", "6"},
    // an empty value that counts as found
    {"k= \n", ""},
    {"k=\"\"\n", ""},
    {"k=\r\n", ""},
    {"k=\" \"\n", " "},
    // no value
    {"", nullptr},
    {"x=v\n", nullptr},
    {"k=\n", nullptr},
    {"k=", nullptr},
    {"k\n", nullptr},
    {"k", nullptr},
    {"=k\n", nullptr},
    {"k=\nk=v\n", nullptr}, // the first line decides
    {"k\nk=v\n", nullptr},
};

TEST(FileGetKeyValue, TheFirstMatchDecides)
{
    const TEST_FOLDER folder;
    for (const VALUE_CASE &row : FIRST_MATCH_CASES) {
        SCOPED_TRACE(row.szText);
        const std::string path = folder.Write("conf", row.szText);
        char szValue[64] = "untouched";
        if (row.szValue == nullptr) {
            EXPECT_FAILS(NLIBCFileGetKeyValue(path.c_str(), "k", szValue, 64, 0), 0,
                         ERR_KEY_NOT_FOUND);
            EXPECT_STREQ(szValue, "untouched");
            EXPECT_FAILS(NLIBCFileGetKeyValue(path.c_str(), "k", nullptr, 0, 0), 0,
                         ERR_KEY_NOT_FOUND);
            continue;
        }
        const int cbNeeded = static_cast<int>(strlen(row.szValue)) + 1;
        EXPECT_QUIET(NLIBCFileGetKeyValue(path.c_str(), "k", szValue, 64, 0), cbNeeded);
        EXPECT_STREQ(szValue, row.szValue);
        EXPECT_QUIET(NLIBCFileGetKeyValue(path.c_str(), "k", nullptr, 0, 0), cbNeeded);
    }
}

TEST(FileGetKeyValue, AKeyMayHoldAnythingButItsSeparator)
{
    const TEST_FOLDER folder;
    const std::string path = folder.Write("conf", "!$%&()*+,-./:<>?@[]^_`{|}~=v\n");
    char szValue[16] = "";
    EXPECT_QUIET(NLIBCFileGetKeyValue(path.c_str(), "!$%&()*+,-./:<>?@[]^_`{|}~", szValue, 16, 0),
                 2);
    EXPECT_STREQ(szValue, "v");
}

constexpr char THREE_MATCHES[] = "k=first\nx=y\nk=second\nk=3\n#k=4\n";
constexpr int MEASURE = -100; // there is no buffer
constexpr char UNTOUCHED[] = "XXXXXXXXXXXXXXX";

struct LOOKUP_CASE {
    const char *szName;
    const char *szText;
    std::vector<int> sizes; // of the buffer, one after the other
    int flags;
    int result;
    u32 code;
    const char *szValue;
};

const LOOKUP_CASE LOOKUP_CASES[] = {
    {"TheLastMatchWinsOnDemand", THREE_MATCHES, {15}, 1, 2, OLD_CODE, "3"},
    {"TheLastMatchIsAskedForByTheLowBit", THREE_MATCHES, {15}, 3, 2, OLD_CODE, "3"},
    {"TheLastMatchIsMeasured", THREE_MATCHES, {MEASURE}, 1, 2, OLD_CODE, UNTOUCHED},
    {"TheFirstMatchWinsElse", THREE_MATCHES, {15}, 0, 6, OLD_CODE, "first"},
    {"TheFirstMatchWinsWithAnotherBit", THREE_MATCHES, {15}, 2, 6, OLD_CODE, "first"},
    {"TheFirstMatchWinsWithAllOthers", THREE_MATCHES, {15}, INT_MAX - 1, 6, OLD_CODE, "first"},
    {"TheLastMatchAloneMustFit", "k=too long for it\nk=v\n", {2}, 1, 2, OLD_CODE, "v"},
    {"TheLastMatchMustFit", "k=v\nk=too long for it\n", {2}, 1, -1, ERR_BUF_TOO_SMALL, "v"},
    // Measured, not copied, and the fit is not looked at.
    {"ALineWithoutValueMakesTheLastMatchForgetTheBuffer",
     "k=\nk=value\n",
     {8, 2},
     1,
     6,
     OLD_CODE,
     UNTOUCHED},
    {"ALineWithoutValueKeepsWhatIsCopied", "k=value\nk\n", {8}, 1, 6, OLD_CODE, "value"},
    {"LinesWithoutValueGiveNone", "k=\nk\n", {8}, 1, 0, ERR_KEY_NOT_FOUND, UNTOUCHED},
    {"ABufferOfTheVerySizeHoldsTheValue", "k=value\n", {6}, 0, 6, OLD_CODE, "value"},
    {"ASmallerBufferStaysAsItWas",
     "k=value\n",
     {5, 1, 0, -1, INT_MIN},
     0,
     -1,
     ERR_BUF_TOO_SMALL,
     UNTOUCHED},
    {"AMissingKeyIsMissingWhateverTheSize",
     "x=value\n",
     {8, 1, 0, -1, INT_MIN},
     0,
     0,
     ERR_KEY_NOT_FOUND,
     UNTOUCHED},
    {"AMissingValueIsMissingWhateverTheSize",
     "k=\n",
     {8, 1, 0, -1, INT_MIN},
     0,
     0,
     ERR_KEY_NOT_FOUND,
     UNTOUCHED},
};

TEST_ROWS(FileLookup, LOOKUP_CASES)
{
    const LOOKUP_CASE &row = GetParam();
    const TEST_FOLDER folder;
    const std::string path = folder.Write("conf", row.szText);
    for (const int cbValue : row.sizes) {
        SCOPED_TRACE(cbValue);
        char szValue[] = "XXXXXXXXXXXXXXX";
        const bool fMeasure = cbValue == MEASURE;
        EXPECT_FAILS(NLIBCFileGetKeyValue(path.c_str(), "k", fMeasure ? nullptr : szValue,
                                          fMeasure ? 0 : cbValue, row.flags),
                     row.result, row.code);
        EXPECT_STREQ(szValue, row.szValue);
        const int cbTold = std::clamp(cbValue, 0, 15);
        EXPECT_STREQ(szValue + cbTold, UNTOUCHED + cbTold) << "nothing behind the buffer";
    }
}

TEST(FileGetKeyValue, ReadsLinesOfAnyLength)
{
    const TEST_FOLDER folder;
    const std::string value(200000, 'v');
    const std::string path =
        folder.Write("conf", std::string(100000, 'x') + "=1\nk=" + value + "\n");
    EXPECT_QUIET(NLIBCFileGetKeyValue(path.c_str(), "k", nullptr, 0, 0), 200001);
    std::string copy(200001, '\0');
    EXPECT_QUIET(NLIBCFileGetKeyValue(path.c_str(), "k", copy.data(), 200001, 0), 200001);
    EXPECT_EQ(copy.c_str(), value);
}

TEST(FileGetKeyValue, FailsWhenTheFileDoesNotOpen)
{
    const TEST_FOLDER folder;
    char szValue[8];
    EXPECT_FAILS(NLIBCFileGetKeyValue(folder.Path("absent").c_str(), "k", szValue, 8, 0), -1,
                 ERR_OPEN_FAILED);
}

TEST(FileCheckKeyValue, ComparesWithoutCase)
{
    const TEST_FOLDER folder;
    const std::string path = folder.Write("conf", "up=YES\nlow=\"yes\"\nother=yes1\nblank= \n");
    const char *const sz = path.c_str();
    for (const int defaultResult : {0, 1, 7, -1}) {
        EXPECT_QUIET(NLIBCFileCheckKeyValue(sz, "up", "yes", defaultResult), 1);
        EXPECT_QUIET(NLIBCFileCheckKeyValue(sz, "low", "YES", defaultResult), 1);
        EXPECT_QUIET(NLIBCFileCheckKeyValue(sz, "other", "yes", defaultResult), 0);
        EXPECT_QUIET(NLIBCFileCheckKeyValue(sz, "blank", "", defaultResult), 1);
        EXPECT_QUIET(NLIBCFileCheckKeyValue(sz, "blank", "yes", defaultResult), 0);
    }
}

TEST(FileCheckKeyValue, AMissingKeyGivesTheDefault)
{
    const TEST_FOLDER folder;
    const std::string path = folder.Write("conf", "novalue=\nnovalue=yes\n");
    for (const int defaultResult : {0, 1, 7, -1}) {
        EXPECT_EQ(NLIBCFileCheckKeyValue(path.c_str(), "absent", "yes", defaultResult),
                  defaultResult);
        EXPECT_EQ(NLIBCFileCheckKeyValue(path.c_str(), "novalue", "yes", defaultResult),
                  defaultResult);
    }
}

TEST(FileCheckKeyValue, AFailedLookupGives0)
{
    const TEST_FOLDER folder;
    EXPECT_FAILS(NLIBCFileCheckKeyValue(folder.Path("absent").c_str(), "k", "yes", 1), 0,
                 ERR_OPEN_FAILED);
    // 511 characters fit the 512 bytes that are read, 512 do not.
    const std::string fits(511, 'v');
    std::string path = folder.Write("conf", "k=" + fits + "\n");
    EXPECT_QUIET(NLIBCFileCheckKeyValue(path.c_str(), "k", fits.c_str(), 0), 1);
    path = folder.Write("conf", "k=" + fits + "v\n");
    EXPECT_FAILS(NLIBCFileCheckKeyValue(path.c_str(), "k", (fits + "v").c_str(), 1), 0,
                 ERR_BUF_TOO_SMALL);
}

} // namespace
