// SPDX-License-Identifier: MIT
#include "nurocore/error.h"
#include "nurocore/pipe.h"
#include "nurocore/process.h"
#include "nurocore/szlist.h"
#include "nurocore/types.h"
#include "steps.h"
#include "streams.h"

#include <cerrno>
#include <climits>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <gtest/gtest.h>
#include <string>
#include <unistd.h>

// What the core library says in the log when a process cannot be made as asked, or a list is asked
// for what it cannot do. How these functions work otherwise is tested in the unit suite.

namespace
{

MACHINE MachineWithFault(const MACHINE_FAULT &fault)
{
    return WithFault(MachineMake(), fault);
}

// ---- fork --------------------------------------------------------------------------------------

TEST(ForkCloseIo, LogsAFailedFork)
{
    (void)ExpectCall(
        {.szName = "no process",
         .machine = MachineWithFault({.szFunction = "fork", .error = EAGAIN}),
         .call = NLIBCForkCloseIo,
         .result = -1,
         .steps = {{"fault fork 1"},
                   {"<11>process.cpp:# fork error, errno=Resource temporarily unavailable"}}});
}

TEST(Fork, SetsACodeAndLogsNothing)
{
    QuietCall(MachineWithFault({.szFunction = "fork"}), [] {
        EXPECT_FAILS(NLIBCFork(0), -1, ERR_FORK_FAILED);
        EXPECT_STREQ(NLIBCErrGetFile(), "process.cpp");
    });
}

volatile sig_atomic_t g_childStatus = -1;

void ChildStatusKeep(int, siginfo_t *pInfo, void *)
{
    g_childStatus = pInfo->si_code == CLD_EXITED ? pInfo->si_status : -2;
}

// The first child is the process that the fork of the grandchild fails in; it ends with 255.
TEST(Fork, LogsWhenTheGrandchildOfADaemonCannotBeMade)
{
    const MACHINE machine = MachineWithFault({.szFunction = "fork", .nCall = 2});
    const RUN_RESULT result = MachineCall(machine, [] {
        struct sigaction action = {};
        action.sa_sigaction = ChildStatusKeep;
        action.sa_flags = SA_SIGINFO;
        ASSERT_EQ(sigaction(SIGCHLD, &action, nullptr), 0);
        EXPECT_QUIET(NLIBCFork(FORK_DAEMONIZE), -1);
        EXPECT_EQ(g_childStatus, 255);
    });
    EXPECT_EQ(LogText(result),
              "<11>process.cpp:# Failed to fork(). errno=[12/Cannot allocate memory]\n");
}

// One call for each flag, and the fork of the grandchild.
bool IsFlagsCall(const std::string &szCall)
{
    for (const char *szName : {"setpriority", "clearenv", "open", "fork", "setsid", "chdir"}) {
        if (szCall.rfind(szName + std::string(" "), 0) == 0) {
            return true;
        }
    }
    return false;
}

// What a process of the last run has called for its flags.
std::string FlagsCalls(const std::string &szProcess)
{
    std::string calls;
    for (const std::string &szLine : MachineCalls()) {
        const std::string szCall =
            szLine.rfind(szProcess + " ", 0) == 0 ? szLine.substr(szProcess.size() + 1) : "";
        calls += IsFlagsCall(szCall) ? szCall + "\n" : "";
    }
    return calls;
}

// The first child applies its flags up to its own fork, the grandchild goes on from there. That
// descriptors are closed is left to other tests: so would be the end of the pipe here.
TEST(Fork, AppliesItsFlagsInOrder)
{
    MACHINE machine = MachineMake();
    machine.fCallsTold = true;
    machine.fMayLeaveChildren = true;
    const RUN_RESULT result = MachineCall(machine, [] {
        int fdEnd[2] = {-1, -1};
        ASSERT_EQ(pipe(fdEnd), 0);
        const int forked = NLIBCFork(0xFB);
        if (forked == 0) {
            _exit(0);
        }
        EXPECT_EQ(forked, 1);
        char ch = 0;
        (void)close(fdEnd[1]);
        EXPECT_EQ(read(fdEnd[0], &ch, 1), 0); // the grandchild has ended
        (void)close(fdEnd[0]);
    });
    EXPECT_EQ(FlagsCalls("0.1"), "setpriority -\nclearenv -\nopen /dev/null\nfork -\n");
    EXPECT_EQ(FlagsCalls("0.1.1"), "setsid -\nchdir -\n");
    EXPECT_EQ(TranscriptText(result), "sleep 0.000001\n");
}

TEST(Execl, LeavesTheCodeOfTheRunWhenItCannotFork)
{
    QuietCall(MachineWithFault({.szFunction = "fork", .error = EAGAIN}), [] {
        EXPECT_FAILS(NLIBCExecl("/bin/umount", "/dev/md2", NULL), -1, ERR_CHILD_FAILED);
    });
}

// ---- pipe streams ------------------------------------------------------------------------------

constexpr char FCNTL_FAILED[] = "<11>pipe.cpp:# fcntl failed, Permission denied\n";

// A tool that prints a row is read with this mode, though descriptors cannot be controlled.
RUN_RESULT PopenWithoutFcntl(const char *szMode)
{
    MACHINE machine = MachineWithFault({.szFunction = "fcntl", .error = EACCES});
    MachineTool(machine, "/sbin/pvs", {.szOut = "row\n", .status = 1});
    return MachineCall(machine, [szMode] {
        RecordReset();
        FILE *const pStream = NLIBCPopen("/sbin/pvs", szMode, NULL);
        ASSERT_NE(pStream, nullptr);
        EXPECT_EQ(StreamRead(pStream), "row\n");
        EXPECT_EQ(NLIBCPclose(pStream), 256);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
}

TEST(Popen, LogsThatItsEndStaysCloseOnExecAndGoesOn)
{
    EXPECT_EQ(LogText(PopenWithoutFcntl("r")), FCNTL_FAILED);
}

TEST(Popen, DoesNotTouchItsEndWhenAskedNotTo)
{
    EXPECT_EQ(LogText(PopenWithoutFcntl("re")), "");
}

// With standard input and output closed the pipe's ends are 0 and 1, so the tool's end has its
// number already and only has to survive the exec.
void PopenOnClosedOutput(const std::string &expected)
{
    const int fdIn = dup(STDIN_FILENO);
    const int fdOut = dup(STDOUT_FILENO);
    (void)close(STDIN_FILENO);
    (void)close(STDOUT_FILENO);
    FILE *const pStream = NLIBCPopen("/sbin/pvs", "re", NULL);
    const std::string text = pStream == nullptr ? "no stream" : StreamRead(pStream);
    const int status = NLIBCPclose(pStream);
    (void)dup2(fdIn, STDIN_FILENO);
    (void)dup2(fdOut, STDOUT_FILENO);
    EXPECT_EQ(text, expected);
    EXPECT_EQ(status, 0);
}

TEST(Popen, LetsTheToolsEndSurviveWhereItHasTheNumberAlready)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, "/sbin/pvs", {.szOut = "row\n"});
    QuietCall(machine, [] { PopenOnClosedOutput("row\n"); });
}

TEST(Popen, LogsInTheChildWhenTheToolsEndWillNotSurvive)
{
    MACHINE machine = MachineWithFault({.szFunction = "fcntl", .error = EACCES});
    MachineTool(machine, "/sbin/pvs", {.szOut = "row\n"});
    const RUN_RESULT result = MachineCall(machine, [] { PopenOnClosedOutput(""); });
    EXPECT_EQ(LogText(result), FCNTL_FAILED);
}

struct POPEN_CASE {
    const char *szFunction;
    int error;
    u32 code;
};

constexpr POPEN_CASE POPEN_CASES[] = {
    {"pipe2", EMFILE, ERR_PIPE_FAILED},
    {"fork", EAGAIN, ERR_FORK_FAILED},
    {"fdopen", EMFILE, ERR_OPEN_FAILED},
};

TEST(Popen, SetsACodeAndLogsNothingWhenItFails)
{
    for (const POPEN_CASE &row : POPEN_CASES) {
        SCOPED_TRACE(row.szFunction);
        MACHINE machine = MachineWithFault({.szFunction = row.szFunction, .error = row.error});
        MachineTool(machine, "/sbin/pvs", {.nTimes = ANY_TIMES});
        machine.fMayLeaveChildren = true;
        QuietCall(machine, [&row] {
            const int nOpen = DescriptorsCount();
            EXPECT_FAILS(NLIBCPopen("/sbin/pvs", "r", NULL), nullptr, row.code);
            EXPECT_STREQ(NLIBCErrGetFile(), "pipe.cpp");
            EXPECT_EQ(DescriptorsCount(), nOpen);
        });
    }
}

// ---- lists -------------------------------------------------------------------------------------

constexpr char OUT_OF_MEMORY[] = "<11>szlist_join.cpp:# Out of memory!!\n";

PNLIBSZLIST ListOfTwo()
{
    PNLIBSZLIST pList = NLIBCSzListAlloc(512);
    (void)NLIBCSzListPush(&pList, "a");
    (void)NLIBCSzListPush(&pList, "b");
    return pList;
}

TEST(SzListJoin, LogsEachBadParameter)
{
    const RUN_RESULT result = MachineCall(MachineMake(), [] {
        PNLIBSZLIST pList = ListOfTwo();
        char achText[16] = "old";
        char *pszText = achText;
        char *pszNone = nullptr;
        int cbText = sizeof(achText);
        int cbNegative = -1;
        const auto refused = [&achText](long long call) {
            EXPECT_EQ(call, -1);
            EXPECT_EQ(NLIBCErrGet(), ERR_BAD_PARAMETER);
            EXPECT_STREQ(NLIBCErrGetFile(), "szlist_join.cpp");
            EXPECT_STREQ(achText, "old");
            RecordReset();
        };
        refused(NLIBCSzListJoin(nullptr, ",", &pszText, &cbText));
        refused(NLIBCSzListJoin(pList, nullptr, &pszText, &cbText));
        refused(NLIBCSzListJoin(pList, ",", nullptr, &cbText));
        refused(NLIBCSzListJoin(pList, ",", &pszNone, &cbText));
        refused(NLIBCSzListJoin(pList, ",", &pszText, nullptr));
        refused(NLIBCSzListJoin(pList, ",", &pszText, &cbNegative));
        refused(NLIBCSzListDump2Str(nullptr, ",", achText, 16));
        refused(NLIBCSzListDump2Str(pList, nullptr, achText, 16));
        refused(NLIBCSzListDump2Str(pList, ",", nullptr, 16));
        refused(NLIBCSzListDump2Str(pList, ",", achText, 0));
        refused(NLIBCSzListDump2Str(pList, ",", achText, -1));
        refused(NLIBCSzListDump2Str(pList, ",", achText, INT_MIN));
        NLIBCSzListFree(pList);
    });
    ExpectSteps(result, 12 * STEPS{{"<11>szlist_join.cpp:# Parameter error"}});
}

TEST(SzListJoin, LogsNothingWhenItWorks)
{
    PNLIBSZLIST pList = ListOfTwo();
    QuietCall(MachineMake(), [&pList] {
        int cbText = 0;
        char *pszText = static_cast<char *>(malloc(1));
        EXPECT_EQ(NLIBCSzListJoin(pList, ",", &pszText, &cbText), 5);
        EXPECT_STREQ(pszText, "a,b");
        free(pszText);
        char achText[3] = "";
        EXPECT_EQ(NLIBCSzListDump2Str(pList, ",", achText, 3), -1);
        EXPECT_EQ(NLIBCErrGet(), ERR_OUT_OF_SPACE);
    });
    NLIBCSzListFree(pList);
}

TEST(SzListJoin, LogsWhenItsBufferCannotGrow)
{
    PNLIBSZLIST pList = ListOfTwo();
    const MACHINE machine = MachineWithFault({.szFunction = "realloc", .error = ENOMEM});
    const RUN_RESULT result = MachineCall(machine, [&pList] {
        int cbText = 4; // a byte less than it needs
        char *pszText = static_cast<char *>(malloc(4));
        EXPECT_FAILS(NLIBCSzListJoin(pList, ",", &pszText, &cbText), -1, ERR_OUT_OF_MEMORY);
        EXPECT_STREQ(NLIBCErrGetFile(), "szlist_join.cpp");
        EXPECT_EQ(pszText, nullptr); // freed, which a sanitizer build proves
    });
    EXPECT_EQ(LogText(result), OUT_OF_MEMORY);
    NLIBCSzListFree(pList);
}

TEST(SzListJoin, LogsWhenItCannotMeasure)
{
    PNLIBSZLIST pList = ListOfTwo();
    const MACHINE machine = MachineWithFault({.szFunction = "calloc", .error = ENOMEM});
    const RUN_RESULT result = MachineCall(machine, [&pList] {
        char achText[16] = "old";
        char *pszText = achText;
        int cbText = sizeof(achText);
        EXPECT_FAILS(NLIBCSzListJoin(pList, ",", &pszText, &cbText), -1, ERR_OUT_OF_MEMORY);
        EXPECT_EQ(pszText, achText); // the buffer stays the caller's
        EXPECT_STREQ(achText, "old");
        EXPECT_EQ(cbText, 16);
    });
    EXPECT_EQ(LogText(result), OUT_OF_MEMORY);
    NLIBCSzListFree(pList);
}

} // namespace
