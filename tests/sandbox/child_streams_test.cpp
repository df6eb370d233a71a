// SPDX-License-Identifier: MIT
//
// The streams of children when a call fails on the way to the program that they become.
#include "last_error.h"
#include "nurocore/error.h"
#include "nurocore/pipe.h"
#include "nurocore/process.h"
#include "sandbox.h"
#include "streams.h"

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <gtest/gtest.h>
#include <string>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

constexpr char CHILD[] = "0.1";
constexpr int STATUS_NOT_EXECUTED = 127;

// The tool itself cannot say anything to the terminal then.
TEST(ChildStreams, AToolWhoseOutputCannotBePipedIsNotRun)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, "/sbin/pvs", {.szOut = "row\n", .nTimes = 0});
    machine.faults = {{.szFunction = "dup2", .error = EBUSY, .szProcess = CHILD}};
    const RUN_RESULT result = MachineCall(machine, [] {
        FILE *const pStream = NLIBCPopen("/sbin/pvs", "r", NULL);
        ASSERT_NE(pStream, nullptr);
        EXPECT_EQ(StreamRead(pStream), "");
        const int status = NLIBCPclose(pStream);
        EXPECT_TRUE(WIFEXITED(status));
        EXPECT_EQ(WEXITSTATUS(status), STATUS_NOT_EXECUTED);
    });
    EXPECT_EQ(result.szOut, "");
}

// Where the null device does not open, the streams that are not piped stay as they are.
TEST(ChildStreams, StayAsTheyAreWithoutANullDevice)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, "/sbin/pvs", {.szOut = "row\n", .szErr = "remark\n"});
    machine.faults = {{.szFunction = "open", .error = ENOENT, .szProcess = CHILD}};
    const RUN_RESULT result = MachineCall(machine, [] {
        FILE *const pStream = NLIBCPopen("/sbin/pvs", "r", NULL);
        ASSERT_NE(pStream, nullptr);
        EXPECT_EQ(StreamRead(pStream), "row\n");
        EXPECT_EQ(NLIBCPclose(pStream), 0);
    });
    EXPECT_EQ(result.szErr, "remark\n");
    ASSERT_EQ(result.events.size(), 2U) << TranscriptText(result);
    EXPECT_FALSE(result.events[1].fNullInput);
}

TEST(ChildStreams, OfAWorkerStayAsTheyAreWithoutANullDevice)
{
    MACHINE machine = MachineMake();
    machine.faults = {{.szFunction = "open", .error = ENOENT, .szProcess = CHILD}};
    const RUN_RESULT result = MachineCall(machine, [] {
        const pid_t pid = NLIBCForkCloseIo();
        if (pid == 0) {
            (void)!write(STDOUT_FILENO, "worker\n", 7);
            _exit(0);
        }
        int status = -1;
        EXPECT_EQ(waitpid(pid, &status, 0), pid);
        EXPECT_EQ(status, 0);
    });
    EXPECT_EQ(result.szOut, "worker\n");
}

// ---- waiting -----------------------------------------------------------------------------------

struct WAIT_CASE {
    int error;
    int result;
    u32 code;
};

// A child that somebody else has waited for has done its work.
constexpr WAIT_CASE RUN_CASES[] = {
    {ECHILD, 0, OLD_CODE},
    {EINVAL, -1, ERR_CHILD_FAILED},
};

TEST(ChildWait, OfARunTellsWhyThereIsNoStatus)
{
    for (const WAIT_CASE &row : RUN_CASES) {
        SCOPED_TRACE(row.error);
        MACHINE machine = MachineMake();
        MachineTool(machine, "/bin/umount", {.nTimes = ANY_TIMES});
        machine.fMayLeaveChildren = true;
        machine.faults = {{.szFunction = "waitpid", .error = row.error, .szProcess = "0"}};
        MachineCall(machine, [&row] {
            EXPECT_FAILS(NLIBCExecl("/bin/umount", NULL), row.result, row.code);
        });
    }
}

constexpr WAIT_CASE DAEMON_CASES[] = {
    {ECHILD, 1, OLD_CODE},
    {EINVAL, -1, OLD_CODE},
};

TEST(ChildWait, OfADaemonTellsWhyThereIsNoStatus)
{
    for (const WAIT_CASE &row : DAEMON_CASES) {
        SCOPED_TRACE(row.error);
        MACHINE machine = MachineMake();
        machine.fMayLeaveChildren = true;
        machine.faults = {{.szFunction = "waitpid", .error = row.error, .szProcess = "0"}};
        MachineCall(machine, [&row] {
            int fds[2];
            ASSERT_EQ(pipe(fds), 0);
            RecordReset();
            const int result = NLIBCFork(FORK_DAEMONIZE);
            if (result == 0) {
                _exit(0);
            }
            EXPECT_EQ(result, row.result);
            EXPECT_EQ(NLIBCErrGet(), row.code);
            // The record of the run is whole when the last of its processes has ended.
            char ch = 0;
            EXPECT_EQ(close(fds[1]), 0);
            EXPECT_EQ(read(fds[0], &ch, 1), 0);
            EXPECT_EQ(close(fds[0]), 0);
        });
    }
}

// Where the disposition of SIGCHLD cannot be read, the run goes on with what it is.
TEST(ChildWait, OfARunNeedsNotToKnowTheDisposition)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, "/bin/umount", {.status = 3});
    machine.faults = {{.szFunction = "sigaction", .error = EINVAL, .szProcess = "0"}};
    MachineCall(machine, [] { EXPECT_EQ(NLIBCExecl("/bin/umount", NULL), 3); });
}

} // namespace
