// SPDX-License-Identifier: MIT
#include "nurocore/conf.h"

#include "last_error.h"
#include "nurocore/error.h"
#include "nurocore/file.h"
#include "nurocore/types.h"
#include "sandbox.h"

#include <cstdio>
#include <fstream>
#include <gtest/gtest.h>
#include <string>
#include <unistd.h>

namespace
{

constexpr char MAX_DISKS_FAILED[] =
    "<11>conf.cpp:# Failed to NLIBCFileGetKeyValue(/etc.defaults/nuroinfo.conf,maxdisks)\n";

MACHINE MachineWithoutConf()
{
    MACHINE machine = MachineMake();
    MachineRemove(machine, "/etc.defaults");
    return machine;
}

// On the machine, while it runs.
void ConfRewrite(const std::string &conf)
{
    std::ofstream(NUROINFO_CONF_PATH) << conf;
}

bool IsMarked(const char *szPath)
{
    return access(szPath, F_OK) == 0;
}

struct YES_CASE {
    const char *szConf;
    int result;
    u32 code; // that the lookup leaves
};

constexpr YES_CASE YES_CASES[] = {
    {"supportraid=yes\n", 1, OLD_CODE},
    {"supportraid=YES\n", 1, OLD_CODE},
    {"supportraid=Yes\n", 1, OLD_CODE},
    {"supportraid=yEs", 1, OLD_CODE},
    {"supportraid=\"yes\"\n", 1, OLD_CODE},
    {"  supportraid \t=  \"YES\" \r\n", 1, OLD_CODE},
    {"supportraid=yes          \n", 1, OLD_CODE},
    {"\"supportraid\"=yes\n", 1, OLD_CODE},
    {"==supportraid=yes\n", 1, OLD_CODE},
    {"supportsas=no\nsupportraid=yes\nsupportraid=no\n", 1, OLD_CODE},
    {"supportraid=no\nsupportraid=yes\n", 0, OLD_CODE},
    {"supportraid=no\n", 0, OLD_CODE},
    {"supportraid=ye\n", 0, OLD_CODE},
    {"supportraid=y\n", 0, OLD_CODE},
    {"supportraid=1\n", 0, OLD_CODE},
    {"supportraid=true\n", 0, OLD_CODE},
    {"supportraid=yess\n", 0, OLD_CODE},
    {"supportraid==yes\n", 0, OLD_CODE},
    {"supportraid=yes\f\n", 0, OLD_CODE},
    {"supportraid=\"yes\n", 0, OLD_CODE},
    {"supportraid=\"\"\n", 0, OLD_CODE},
    {"supportraid=   \n", 0, OLD_CODE},
    {"supportraid=\r\n", 0, OLD_CODE},
    // Five characters do not fit, whatever they are.
    {"supportraid=yesno\n", 0, ERR_BUF_TOO_SMALL},
    {"supportraid=yes=1\n", 0, ERR_BUF_TOO_SMALL},
    {"supportraid=yes, it does\n", 0, ERR_BUF_TOO_SMALL},
    // No such key, or no value.
    {"", 0, ERR_KEY_NOT_FOUND},
    {"supportraid=\n", 0, ERR_KEY_NOT_FOUND},
    {"supportraid=\nsupportraid=yes\n", 0, ERR_KEY_NOT_FOUND},
    {"supportraid\n", 0, ERR_KEY_NOT_FOUND},
    {"supportraid yes\n", 0, ERR_KEY_NOT_FOUND},
    {"#supportraid=yes\n", 0, ERR_KEY_NOT_FOUND},
    {";supportraid=yes\n", 0, ERR_KEY_NOT_FOUND},
    {" #supportraid=yes\n", 0, ERR_KEY_NOT_FOUND},
    {"Supportraid=yes\n", 0, ERR_KEY_NOT_FOUND},
    {"supportraid2=yes\n", 0, ERR_KEY_NOT_FOUND},
};

TEST(ConfKeyIsYes, TakesYesOfAnyCaseAlone)
{
    QuietCall(MachineMake(), [] {
        for (const YES_CASE &row : YES_CASES) {
            (void)unlink(NUROINFO_CONF_PATH);
            ConfRewrite(row.szConf);
            RecordReset();
            EXPECT_EQ(NLIBCConfKeyIsYes("supportraid"), row.result) << row.szConf;
            EXPECT_EQ(NLIBCErrGet(), row.code) << row.szConf;
        }
    });
}

TEST(ConfKeyIsYes, IsNoForNullAndWithoutTheFile)
{
    QuietCall(MachineWithoutConf(), [] {
        EXPECT_QUIET(NLIBCConfKeyIsYes(nullptr), 0);
        EXPECT_EQ(NLIBCConfKeyIsYes("supportraid"), 0);
        EXPECT_EQ(NLIBCErrGet(), ERR_OPEN_FAILED);
    });
}

// A number as text of exactly so many characters.
std::string ZeroFilled(size_t cch, const std::string &number)
{
    return std::string(cch - number.size(), '0') + number;
}

struct NUMBER_CASE {
    std::string value; // with its line end
    int number;
    bool fFound;
};

const NUMBER_CASE NUMBER_CASES[] = {
    {"4\n", 4, true},
    {"12", 12, true},
    {" \"16\" \r\n", 16, true},
    {"0\n", 0, true},
    {"-3\n", -3, true},
    {"+5\n", 5, true},
    {"010\n", 10, true},
    {"0x10\n", 0, true},
    {"12 disks\n", 12, true},
    {"8.5\n", 8, true},
    {"many\n", 0, true},
    {"   \n", 0, true},
    {"\"\"\n", 0, true},
    {"\r\n", 0, true},
    {"2147483647\n", 2147483647, true},
    {"2147483648\n", 2147483647, true},
    {"4294967298\n", 2147483647, true},
    {"99999999999999999999\n", 2147483647, true},
    {"-2147483649\n", -2147483647 - 1, true},
    {ZeroFilled(63, "7") + "\n", 7, true},
    {ZeroFilled(64, "7") + "\n", 0, false},
    {"\n", 0, false},
    {"", 0, false},
};

TEST(ConfMaxDisks, IsTheNumberThatTheValueBeginsWith)
{
    for (const NUMBER_CASE &row : NUMBER_CASES) {
        SCOPED_TRACE(row.value);
        const RUN_RESULT result = MachineCall(MachineWithConf("maxdisks=" + row.value), [&row] {
            EXPECT_EQ(NLIBCConfMaxDisksGet(), row.number);
        });
        EXPECT_EQ(LogText(result), row.fFound ? "" : MAX_DISKS_FAILED);
    }
}

TEST(ConfMaxDisks, IsZeroAndLoggedWithoutKeyOrFile)
{
    const auto ask = [] { EXPECT_EQ(NLIBCConfMaxDisksGet(), 0); };
    EXPECT_EQ(LogText(MachineCall(MachineWithConf("#maxdisks=4\n"), ask)), MAX_DISKS_FAILED);
    EXPECT_EQ(LogText(MachineCall(MachineWithConf("MAXDISKS=4\n"), ask)), MAX_DISKS_FAILED);
    EXPECT_EQ(LogText(MachineCall(MachineWithoutConf(), ask)), MAX_DISKS_FAILED);
}

TEST(ConfMaxDisks, IsReadAnewOnEveryCall)
{
    QuietCall(MachineWithConf("maxdisks=4\n"), [] {
        EXPECT_EQ(NLIBCConfMaxDisksGet(), 4);
        ConfRewrite("maxdisks=12\nmax_sys_raid_disks=2\n");
        EXPECT_EQ(NLIBCConfMaxDisksGet(), 12);
        EXPECT_EQ(NLIBCConfMaxSysRaidDisksGet(), 2);
    });
}

TEST(ConfMaxSysRaidDisks, FallsBackToTheNumberOfDisksWhenItHasNoValue)
{
    for (const NUMBER_CASE &row : NUMBER_CASES) {
        SCOPED_TRACE(row.value);
        const std::string conf = "maxdisks=9\nmax_sys_raid_disks=" + row.value;
        QuietCall(MachineWithConf(conf), [&row] {
            EXPECT_EQ(NLIBCConfMaxSysRaidDisksGet(), row.fFound ? row.number : 9);
        });
    }
}

TEST(ConfMaxSysRaidDisks, LogsTheFailedFallbackOnly)
{
    const auto ask = [] { EXPECT_EQ(NLIBCConfMaxSysRaidDisksGet(), 0); };
    EXPECT_EQ(LogText(MachineCall(MachineWithConf(""), ask)), MAX_DISKS_FAILED);
    EXPECT_EQ(LogText(MachineCall(MachineWithoutConf(), ask)), MAX_DISKS_FAILED);
    EXPECT_EQ(LogText(MachineCall(MachineWithConf("max_sys_raid_disks=0\n"), ask)), "");
}

constexpr char MARKER[] = "/tmp/.dualhead";
constexpr char MARKER_NOT[] = "/tmp/.not.dualhead";

struct DUAL_HEAD_CASE {
    std::string conf;
    int result;
};

const DUAL_HEAD_CASE DUAL_HEAD_CASES[] = {
    {"support_dual_head=yes\n", 1},
    {"support_dual_head=\"YES\"", 1},
    {"support_dual_head= Yes \r\n", 1},
    {"support_dual_head=no\n", 0},
    {"support_dual_head=yesno\n", 0},
    {"support_dual_head=\n", 0},
    {"support_dual_head= \n", 0},
    {"#support_dual_head=yes\n", 0},
    {"", 0},
    {"support_dual_head=" + std::string(511, 'y') + "\n", 0},
};

TEST(ConfSupportDualHead, AsksTheModelAndLeavesAMarker)
{
    for (const DUAL_HEAD_CASE &row : DUAL_HEAD_CASES) {
        SCOPED_TRACE(row.conf);
        const RUN_RESULT result = QuietCall(MachineWithConf(row.conf), [&row] {
            EXPECT_EQ(NLIBCConfSupportDualHead(), row.result);
            EXPECT_EQ(IsMarked(MARKER), row.result == 1);
            EXPECT_EQ(IsMarked(MARKER_NOT), row.result == 0);
        });
        EXPECT_EQ(MachineFileRead(row.result == 1 ? MARKER : MARKER_NOT), "");
    }
}

void ExpectFailedLookupTakenForNo(const MACHINE &machine, const std::string &szCode)
{
    const RUN_RESULT result = MachineCall(machine, [] {
        EXPECT_EQ(NLIBCConfSupportDualHead(), 0);
        EXPECT_TRUE(IsMarked(MARKER_NOT));
    });
    ASSERT_EQ(result.log.size(), 1U);
    EXPECT_EQ(result.log[0].priority, 15);
    EXPECT_EQ(result.log[0].szText.find("keyvalue.cpp:# NLIBCFileGetKeyValue(support_dual_head) "
                                        "failed [" +
                                        szCode + " keyvalue.cpp:"),
              0U)
        << result.log[0].szText;
}

TEST(ConfSupportDualHead, TakesAFailedLookupForNo)
{
    ExpectFailedLookupTakenForNo(MachineWithoutConf(), "0x0900");
    ExpectFailedLookupTakenForNo(
        MachineWithConf("support_dual_head=" + std::string(512, 'y') + "\n"), "0x0100");
}

struct MARKER_CASE {
    bool fMarked;
    bool fMarkedNot;
    int result;
};

constexpr MARKER_CASE MARKER_CASES[] = {{true, false, 1}, {false, true, 0}, {true, true, 1}};

TEST(ConfSupportDualHead, BelievesAMarkerWithoutAskingTheModel)
{
    for (const MARKER_CASE &row : MARKER_CASES) {
        SCOPED_TRACE(testing::Message() << row.fMarked << ' ' << row.fMarkedNot);
        // The model says the opposite.
        MACHINE machine =
            MachineWithConf(row.result == 1 ? "support_dual_head=no\n" : "support_dual_head=yes\n");
        if (row.fMarked) {
            MachineFile(machine, MARKER, "old\n");
        }
        if (row.fMarkedNot) {
            MachineFile(machine, MARKER_NOT, "old\n");
        }
        QuietCall(machine, [&row] {
            EXPECT_EQ(NLIBCConfSupportDualHead(), row.result);
            EXPECT_EQ(IsMarked(MARKER), row.fMarked);
            EXPECT_EQ(IsMarked(MARKER_NOT), row.fMarkedNot);
        });
        EXPECT_EQ(MachineFileRead(row.fMarked ? MARKER : MARKER_NOT), "old\n");
    }
}

TEST(ConfSupportDualHead, TakesAnythingThatIsThereForAMarker)
{
    MACHINE folder = MachineWithoutConf();
    MachineFolder(folder, MARKER);
    EXPECT_EQ(LogText(MachineCall(folder, [] { EXPECT_EQ(NLIBCConfSupportDualHead(), 1); })), "");

    MACHINE folderNot = MachineWithoutConf();
    MachineFolder(folderNot, MARKER_NOT);
    EXPECT_EQ(LogText(MachineCall(folderNot, [] { EXPECT_EQ(NLIBCConfSupportDualHead(), 0); })),
              "");
}

TEST(ConfSupportDualHead, IsAskedOnceInAProcess)
{
    QuietCall(MachineWithConf("support_dual_head=yes\n"), [] {
        EXPECT_EQ(NLIBCConfSupportDualHead(), 1);
        EXPECT_EQ(unlink(MARKER), 0);
        ConfRewrite("support_dual_head=no\n");
        EXPECT_EQ(NLIBCConfSupportDualHead(), 1);
        EXPECT_FALSE(IsMarked(MARKER));
        EXPECT_FALSE(IsMarked(MARKER_NOT));
    });

    QuietCall(MachineWithConf("support_dual_head=no\n"), [] {
        EXPECT_EQ(NLIBCConfSupportDualHead(), 0);
        EXPECT_EQ(unlink(MARKER_NOT), 0);
        ConfRewrite("support_dual_head=yes\n");
        EXPECT_EQ(NLIBCConfSupportDualHead(), 0);
        EXPECT_FALSE(IsMarked(MARKER));
        EXPECT_FALSE(IsMarked(MARKER_NOT));
    });
}

TEST(ConfSupportDualHead, AnswersAllTheSameWhenNoMarkerCanBeLeft)
{
    MACHINE machine = MachineWithConf("support_dual_head=yes\n");
    MachineLink(machine, MARKER, "/no/such/file");
    MachineLink(machine, MARKER_NOT, "/no/such/file");
    const RUN_RESULT result = MachineCall(machine, [] {
        EXPECT_EQ(NLIBCConfSupportDualHead(), 1);
        EXPECT_EQ(NLIBCConfSupportDualHead(), 1);
    });
    EXPECT_EQ(LogText(result),
              "<11>file.cpp:# file exist: /tmp/.dualhead, errno=No such file or directory\n"
              "<11>conf.cpp:# Failed to touch '/tmp/.dualhead'\n");

    MachineConf(machine, "support_dual_head=no\n");
    const RUN_RESULT resultNot =
        MachineCall(machine, [] { EXPECT_EQ(NLIBCConfSupportDualHead(), 0); });
    EXPECT_EQ(LogText(resultNot),
              "<11>file.cpp:# file exist: /tmp/.not.dualhead, errno=No such file or directory\n"
              "<11>conf.cpp:# Failed to touch '/tmp/.not.dualhead'\n");
}

TEST(ConfSupportDualHead, IsNoMoreAMarkerWhenItsLinkLeadsNowhere)
{
    MACHINE machine = MachineWithConf("support_dual_head=no\n");
    MachineLink(machine, MARKER, "/no/such/file");
    QuietCall(machine, [] {
        EXPECT_EQ(NLIBCConfSupportDualHead(), 0);
        EXPECT_TRUE(IsMarked(MARKER_NOT));
    });
}

TEST(FileTouch, LogsWhatItCannotDo)
{
    const RUN_RESULT result = MachineCall(MachineMake(), [] {
        RecordReset();
        EXPECT_EQ(NLIBCFileTouch("/no/folder/file"), -1);
        EXPECT_EQ(NLIBCFileTouch("/tmp"), -1);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
        EXPECT_EQ(NLIBCFileTouch(nullptr), -1);
        EXPECT_EQ(NLIBCErrGet(), ERR_BAD_PARAMETER);
        EXPECT_EQ(NLIBCFileTouch("/tmp/new"), 0);
        EXPECT_EQ(NLIBCFileTouch("/tmp/new"), 0);
    });
    EXPECT_EQ(LogText(result),
              "<11>file.cpp:# file exist: /no/folder/file, errno=No such file or directory\n"
              "<11>file.cpp:# file exist: /tmp, errno=Is a directory\n"
              "<11>file.cpp:# Bad parameters\n");
}

} // namespace
