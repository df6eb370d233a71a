// SPDX-License-Identifier: MIT
#include "nurocore/error.h"

#include "hwcontrol/disk_name.h"
#include "hwcontrol/disk_path.h"
#include "last_error.h"
#include "nurocore/szlist.h"

#include <string>

namespace
{

// Read before main, so before any test has failed a call.
struct RECORD {
    u32 code;
    const char *szFile;
    int line;
};

const RECORD g_atStart = {NLIBCErrGet(), NLIBCErrGetFile(), NLIBCErrGetLine()};

TEST(LastError, IsZeroBeforeAnyFailure)
{
    EXPECT_EQ(g_atStart.code, 0U);
    EXPECT_EQ(g_atStart.szFile, nullptr);
    EXPECT_EQ(g_atStart.line, 0);
}

TEST(LastError, HandsBackAllThreeValues)
{
    static constexpr char FILE_NAME[] = "somewhere.cpp";
    NLIBCErrSet(0x8100, FILE_NAME, 77);
    EXPECT_EQ(NLIBCErrGet(), 0x8100U);
    EXPECT_EQ(NLIBCErrGetFile(), FILE_NAME) << "the name is kept by address";
    EXPECT_EQ(NLIBCErrGetLine(), 77);
}

TEST(LastError, HoldsAll32Bits)
{
    NLIBCErrSet(0xFFFFFF00, "high.cpp", -1);
    EXPECT_EQ(NLIBCErrGet(), 0xFFFFFF00U);
    EXPECT_EQ(NLIBCErrGetLine(), -1);
}

TEST(LastError, TheSecondOfTwoFailuresIsLeft)
{
    NLIBCErrSet(0x0100, "first.cpp", 1);
    NLIBCErrSet(0x0200, "second.cpp", 2);
    EXPECT_EQ(NLIBCErrGet(), 0x0200U);
    EXPECT_STREQ(NLIBCErrGetFile(), "second.cpp");
    EXPECT_EQ(NLIBCErrGetLine(), 2);
}

TEST(LastError, ASuccessLeavesTheFailureBefore)
{
    RecordReset();
    PNLIBSZLIST pList = NLIBCSzListAlloc(512);
    ASSERT_EQ(NLIBCSzListPush(&pList, "sda"), 0);
    NLIBCSzListFree(pList);
    EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    EXPECT_STREQ(NLIBCErrGetFile(), "before");
    EXPECT_EQ(NLIBCErrGetLine(), 1);
}

TEST(LastError, NamesTheBareFileAndTheLineOfTheFailure)
{
    EXPECT_FAILS(NLIBCSzListGet(nullptr, 0), nullptr, ERR_BAD_PARAMETER);
    EXPECT_STREQ(NLIBCErrGetFile(), "szlist_base.cpp");
    const int lineOfGet = NLIBCErrGetLine();
    EXPECT_GT(lineOfGet, 1);
    EXPECT_FAILS(NLIBCSzListFind(nullptr, "sda"), -1, ERR_BAD_PARAMETER);
    EXPECT_STREQ(NLIBCErrGetFile(), "szlist_base.cpp");
    EXPECT_NE(NLIBCErrGetLine(), lineOfGet);
    EXPECT_FAILS(DiskIsExist(nullptr), -1, ERR_BAD_PARAMETER);
    EXPECT_STREQ(NLIBCErrGetFile(), "disk_name.cpp");
    EXPECT_FAILS(DiskPathParse(nullptr, nullptr), -1, ERR_BAD_PARAMETER);
    EXPECT_STREQ(NLIBCErrGetFile(), "disk_path.cpp");
}

TEST(LastError, EveryCodeHasItsNumber)
{
    struct CODE {
        u32 code;
        u32 expected;
    };
    constexpr CODE CODES[] = {
        {ERR_BUF_TOO_SMALL, 0x0100},  {ERR_OUT_OF_MEMORY, 0x0200}, {ERR_DEVICE_ABSENT, 0x0600},
        {ERR_OPEN_FAILED, 0x0900},    {ERR_READ_FAILED, 0x0A00},   {ERR_BAD_PARAMETER, 0x0D00},
        {ERR_KEY_NOT_FOUND, 0x2000},  {ERR_CHILD_FAILED, 0x2A00},  {ERR_NO_MEMBER_DISK, 0x6100},
        {ERR_SYSCALL_FAILED, 0x8000}, {ERR_PIPE_FAILED, 0x8100},   {ERR_FORK_FAILED, 0x9700},
        {ERR_TEXT_NOT_FOUND, 0x9A00}, {ERR_INTERRUPTED, 0xA700},   {ERR_BAD_FORMAT, 0xBE00},
        {ERR_OUT_OF_SPACE, 0xBF00},   {ERR_NO_SUCH_CHILD, 0xE300},
    };
    for (const CODE &row : CODES) {
        EXPECT_EQ(row.code, row.expected);
    }
}

} // namespace
