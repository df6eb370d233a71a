// SPDX-License-Identifier: MIT
#include "nurocore/conf.h"

#include "nurocore/error.h"
#include "nurocore/file.h"
#include "nurocore/types.h"
#include "steps.h"

#include <cstdio>
#include <fstream>
#include <gtest/gtest.h>
#include <string>
#include <unistd.h>
#include <vector>

namespace
{

const STEPS MAX_DISKS_FAILED = {
    {"<11>conf.cpp:# Failed to NLIBCFileGetKeyValue(/etc.defaults/nuroinfo.conf,maxdisks)"}};

MACHINE MachineWithoutConf()
{
    return Without(MachineMake(), "/etc.defaults");
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
    int result;
    u32 code; // that the lookup leaves
    std::vector<const char *> confs;
};

const YES_CASE YES_CASES[] = {
    {1,
     OLD_CODE,
     {"supportraid=yes\n", "supportraid=YES\n", "supportraid=Yes\n", "supportraid=yEs",
      "supportraid=\"yes\"\n", "  supportraid \t=  \"YES\" \r\n", "supportraid=yes          \n",
      "\"supportraid\"=yes\n", "==supportraid=yes\n",
      "supportsas=no\nsupportraid=yes\nsupportraid=no\n"}},
    {0,
     OLD_CODE,
     {"supportraid=no\nsupportraid=yes\n", "supportraid=no\n", "supportraid=ye\n",
      "supportraid=y\n", "supportraid=1\n", "supportraid=true\n", "supportraid=yess\n",
      "supportraid==yes\n", "supportraid=yes\f\n", "supportraid=\"yes\n", "supportraid=\"\"\n",
      "supportraid=   \n", "supportraid=\r\n"}},
    // Five characters do not fit, whatever they are.
    {0,
     ERR_BUF_TOO_SMALL,
     {"supportraid=yesno\n", "supportraid=yes=1\n", "supportraid=yes, it does\n"}},
    // No such key, or no value.
    {0,
     ERR_KEY_NOT_FOUND,
     {"", "supportraid=\n", "supportraid=\nsupportraid=yes\n", "supportraid\n", "supportraid yes\n",
      "#supportraid=yes\n", ";supportraid=yes\n", " #supportraid=yes\n", "Supportraid=yes\n",
      "supportraid2=yes\n"}},
};

TEST(ConfKeyIsYes, TakesYesOfAnyCaseAlone)
{
    QuietCall(MachineMake(), [] {
        for (const YES_CASE &row : YES_CASES) {
            for (const char *const szConf : row.confs) {
                SCOPED_TRACE(szConf);
                (void)unlink(NUROINFO_CONF_PATH);
                ConfRewrite(szConf);
                EXPECT_FAILS(NLIBCConfKeyIsYes("supportraid"), row.result, row.code);
            }
        }
    });
}

TEST(ConfKeyIsYes, IsNoForNullAndWithoutTheFile)
{
    QuietCall(MachineWithoutConf(), [] {
        EXPECT_QUIET(NLIBCConfKeyIsYes(nullptr), 0);
        EXPECT_FAILS(NLIBCConfKeyIsYes("supportraid"), 0, ERR_OPEN_FAILED);
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
        ExpectSteps(result, row.fFound ? STEPS{} : MAX_DISKS_FAILED);
    }
}

TEST(ConfMaxDisks, IsZeroAndLoggedWithoutKeyOrFile)
{
    for (const MACHINE &machine : {MachineWithConf("#maxdisks=4\n"),
                                   MachineWithConf("MAXDISKS=4\n"), MachineWithoutConf()}) {
        ExpectSteps(MachineCall(machine, [] { EXPECT_EQ(NLIBCConfMaxDisksGet(), 0); }),
                    MAX_DISKS_FAILED);
    }
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
    ExpectSteps(MachineCall(MachineWithConf(""), ask), MAX_DISKS_FAILED);
    ExpectSteps(MachineCall(MachineWithoutConf(), ask), MAX_DISKS_FAILED);
    QuietCall(MachineWithConf("max_sys_raid_disks=0\n"), ask);
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
    for (const bool fDual : {true, false}) {
        MACHINE machine = MachineWithoutConf();
        MachineFolder(machine, fDual ? MARKER : MARKER_NOT);
        QuietCall(machine, [fDual] { EXPECT_EQ(NLIBCConfSupportDualHead(), fDual ? 1 : 0); });
    }
}

TEST(ConfSupportDualHead, IsAskedOnceInAProcess)
{
    const std::string yes = "support_dual_head=yes\n";
    const std::string no = "support_dual_head=no\n";
    for (const bool fDual : {true, false}) {
        QuietCall(MachineWithConf(fDual ? yes : no), [&] {
            EXPECT_EQ(NLIBCConfSupportDualHead(), fDual ? 1 : 0);
            EXPECT_EQ(unlink(fDual ? MARKER : MARKER_NOT), 0);
            ConfRewrite(fDual ? no : yes);
            EXPECT_EQ(NLIBCConfSupportDualHead(), fDual ? 1 : 0);
            EXPECT_FALSE(IsMarked(MARKER));
            EXPECT_FALSE(IsMarked(MARKER_NOT));
        });
    }
}

TEST(ConfSupportDualHead, AnswersAllTheSameWhenNoMarkerCanBeLeft)
{
    const struct {
        const char *szConf;
        int result;
        STEPS steps;
    } rows[] = {
        {"support_dual_head=yes\n",
         1,
         {{"<11>file.cpp:# file exist: /tmp/.dualhead, errno=No such file or directory"},
          {"<11>conf.cpp:# Failed to touch '/tmp/.dualhead'"}}},
        {"support_dual_head=no\n",
         0,
         {{"<11>file.cpp:# file exist: /tmp/.not.dualhead, errno=No such file or directory"},
          {"<11>conf.cpp:# Failed to touch '/tmp/.not.dualhead'"}}},
    };
    for (const auto &row : rows) {
        MACHINE machine = MachineWithConf(row.szConf);
        MachineLink(machine, MARKER, "/no/such/file");
        MachineLink(machine, MARKER_NOT, "/no/such/file");
        ExpectSteps(MachineCall(machine,
                                [&row] {
                                    EXPECT_EQ(NLIBCConfSupportDualHead(), row.result);
                                    EXPECT_EQ(NLIBCConfSupportDualHead(), row.result);
                                }),
                    row.steps);
    }
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
