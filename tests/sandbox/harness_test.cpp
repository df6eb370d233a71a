// SPDX-License-Identifier: MIT
//
// The suite must notice what it is there to notice.
#include "sandbox.h"

#include "nurocore/process.h"
#include "nurostoragecore/raid_remove.h"
#include "nurostoragecore/space.h"

#include <gtest/gtest-spi.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

namespace
{

bool HasProblem(const RUN_RESULT &result, const std::string &szPart)
{
    return std::any_of(result.problems.begin(), result.problems.end(),
                       [&](const std::string &sz) { return sz.find(szPart) != std::string::npos; });
}

double SecondsOf(const struct rusage &usage)
{
    return static_cast<double>(usage.ru_utime.tv_sec + usage.ru_stime.tv_sec) +
           static_cast<double>(usage.ru_utime.tv_usec + usage.ru_stime.tv_usec) / 1e6;
}

// Of this process and of all that it has waited for.
double ProcessorSeconds()
{
    struct rusage self = {};
    struct rusage children = {};
    (void)getrusage(RUSAGE_SELF, &self);
    (void)getrusage(RUSAGE_CHILDREN, &children);
    return SecondsOf(self) + SecondsOf(children);
}

const MACHINE &EmptyMachine()
{
    static const MACHINE machine = MachineMake();
    return machine;
}

} // namespace

TEST(Harness, WhatTheProgramPrintsAndItsStatusComeBack)
{
    const RUN_RESULT result = MachineRun(MachineMake(), {"no-such-word"});
    EXPECT_TRUE(result.szOut.starts_with("command not recognized\nusage:\n"));
    EXPECT_EQ(result.szErr, "");
    EXPECT_EQ(result.status, 1);
    EXPECT_EQ(result.signal, 0);
    EXPECT_EQ(LogText(result), "");
    EXPECT_EQ(TranscriptText(result), "");
}

TEST(Harness, ACommandThatNoRowExpectsIsAProblem)
{
    const RUN_RESULT result = MachineTry(MachineMake(), {"destroy", "2"});
    EXPECT_TRUE(HasProblem(result, "no row expects: /sbin/pvs -o "));
    EXPECT_EQ(result.events.size(), 1U);
}

TEST(Harness, ACommandWithOtherArgumentsIsAProblem)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, "/sbin/pvs -o pv_name --noheading");
    const RUN_RESULT result = MachineTry(machine, {"destroy", "2"});
    EXPECT_TRUE(HasProblem(result, "no row expects: /sbin/pvs -o "));
    EXPECT_TRUE(HasProblem(result, "expected 1 times, run 0 times: /sbin/pvs -o pv_name"));
}

TEST(Harness, ARowThatIsNotRunIsAProblem)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, "/sbin/mdadm -S /dev/md2");
    const RUN_RESULT result = MachineTry(machine, {"status", "2"});
    EXPECT_TRUE(HasProblem(result, "expected 1 times, run 0 times: /sbin/mdadm -S /dev/md2"));
}

TEST(Harness, ARowThatIsRunTooOftenIsAProblem)
{
    static MACHINE machine = MachineMake();
    MachineTool(machine, "/sbin/mdadm -S /dev/md2", {.status = 1, .nTimes = 2});
    static RUN_RESULT result;
    EXPECT_NONFATAL_FAILURE(result = MachineCall(machine,
                                                 [] {
                                                     (void)RAIDStop("/dev/md2");
                                                     (void)RAIDStop("/dev/md2");
                                                     (void)RAIDStop("/dev/md2");
                                                 }),
                            "no row expects: /sbin/mdadm -S /dev/md2");
    EXPECT_EQ(result.events.size(), 3U);
}

TEST(Harness, AProblemFailsTheTest)
{
    static RUN_RESULT result;
    EXPECT_NONFATAL_FAILURE(result = MachineRun(EmptyMachine(), {"destroy", "2"}),
                            "a command that no row expects");
}

TEST(Harness, AHangIsBounded)
{
    MACHINE machine = MachineMake();
    machine.msSilence = 300;
    MachineTool(machine, "/sbin/pvs ...", {.nMeet = NEVER});
    const RUN_RESULT result = MachineTry(machine, {"destroy", "2"});
    EXPECT_TRUE(result.fTimedOut);
    EXPECT_TRUE(HasProblem(result, "it hangs: silent for 300 ms"));
    EXPECT_EQ(result.status, -1);
}

TEST(Harness, AChildLeftBehindIsAProblem)
{
    static RUN_RESULT result;
    EXPECT_NONFATAL_FAILURE(result = MachineCall(EmptyMachine(),
                                                 [] {
                                                     if (fork() == 0) {
                                                         pause();
                                                     }
                                                 }),
                            "it left 0 children unreaped and 1 running");
    EXPECT_EQ(result.nRunning, 1);
}

TEST(Harness, AChildNotWaitedForIsAProblem)
{
    static RUN_RESULT result;
    EXPECT_NONFATAL_FAILURE(result = MachineCall(EmptyMachine(),
                                                 [] {
                                                     if (fork() == 0) {
                                                         _exit(0);
                                                     }
                                                     siginfo_t info = {};
                                                     waitid(P_ALL, 0, &info, WEXITED | WNOWAIT);
                                                 }),
                            "it left 1 children unreaped and 0 running");
    EXPECT_EQ(result.nUnreaped, 1);
}

TEST(Harness, AFailedExpectationOfABodyFailsTheTest)
{
    static RUN_RESULT result;
    EXPECT_NONFATAL_FAILURE(
        result = MachineCall(EmptyMachine(), [] { EXPECT_EQ(1, 2) << "told by the body"; }),
        "told by the body");
}

TEST(Harness, ABodyThatDiesFailsTheTest)
{
    static RUN_RESULT result;
    EXPECT_NONFATAL_FAILURE(result = MachineCall(EmptyMachine(), [] { (void)raise(SIGKILL); }),
                            "the body ended with status -1, signal 9");
    EXPECT_EQ(result.signal, SIGKILL);
}

TEST(Harness, TheAnswersOfARowAreGiven)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, {"/sbin/mdadm", "", "two words", "\"\n"},
                {.szOut = "out",
                 .szErr = "err\n",
                 .status = 3,
                 .writes = {{"/tmp/a/b", "left"}},
                 .removes = {"/proc/devices"}});
    const RUN_RESULT result = MachineCall(machine, [] {
        EXPECT_EQ(SpaceExecl("/sbin/mdadm", "", "two words", "\"\n", nullptr), 3 << 8);
    });
    EXPECT_EQ(TranscriptText(result), "/sbin/mdadm \"\" \"two words\" \"\\\"\\n\"\n");
    EXPECT_EQ(MachineFileRead("/tmp/a/b"), "left");
    EXPECT_EQ(MachineFileRead("/proc/devices"), std::nullopt);
    EXPECT_NE(
        MachineFileRead("/var/log/space_operation_error.log").value_or("").find("Error=\"err \""),
        std::string::npos);
}

TEST(Harness, AToolCanDieBySignal)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, "/sbin/mdadm -S /dev/md2", {.signal = SIGTERM});
    MachineCall(machine,
                [] { EXPECT_EQ(SpaceExecl("/sbin/mdadm", "-S", "/dev/md2", nullptr), SIGTERM); });
}

TEST(Harness, ARowCountsWhileItsFileIsThere)
{
    MACHINE machine = MachineMake();
    MachineTool(
        machine, "/sbin/mdadm -S /dev/md2",
        {.status = 1, .nTimes = ANY_TIMES, .removes = {"/tmp/busy"}, .szWhileThere = "/tmp/busy"});
    MachineTool(machine, "/sbin/mdadm -S /dev/md2", {.status = 0});
    MachineFile(machine, "/tmp/busy", "");
    MachineCall(machine, [] {
        EXPECT_EQ(SpaceExecl("/sbin/mdadm", "-S", "/dev/md2", nullptr), 1 << 8);
        EXPECT_EQ(SpaceExecl("/sbin/mdadm", "-S", "/dev/md2", nullptr), 0);
    });
}

TEST(Harness, RowsAnswerOneAfterTheOther)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, "/sbin/mdadm -S *", {.status = 1, .nTimes = 2});
    MachineTool(machine, "/sbin/mdadm ...", {.status = 0, .nTimes = ANY_TIMES});
    MachineCall(machine, [] {
        EXPECT_EQ(SpaceExecl("/sbin/mdadm", "-S", "/dev/md2", nullptr), 256);
        EXPECT_EQ(SpaceExecl("/sbin/mdadm", "-S", "/dev/md3", nullptr), 256);
        EXPECT_EQ(SpaceExecl("/sbin/mdadm", "-S", "/dev/md2", nullptr), 0);
        EXPECT_EQ(SpaceExecl("/sbin/mdadm", nullptr), 0);
    });
}

TEST(Harness, ToolsCanBeMissingFoldersOrNotExecutable)
{
    MACHINE machine = MachineMake();
    machine.tools = {{"/sbin/mdadm", TOOL_KIND::MISSING},
                     {"/sbin/pvs", TOOL_KIND::FOLDER},
                     {"/bin/umount", TOOL_KIND::NOT_EXECUTABLE}};
    MachineCall(machine, [] {
        EXPECT_EQ(NLIBCExecl("/sbin/mdadm", nullptr), 255);
        EXPECT_EQ(NLIBCExecl("/sbin/pvs", nullptr), 255);
        EXPECT_EQ(NLIBCExecl("/bin/umount", nullptr), 255);
    });
}

TEST(Harness, SleepsAreToldNotSlept)
{
    const RUN_RESULT result = MachineCall(MachineMake(), [] {
        EXPECT_EQ(sleep(3000), 0U);
        EXPECT_EQ(usleep(1500), 0);
        const struct timespec time = {7, 0};
        EXPECT_EQ(nanosleep(&time, nullptr), 0);
    });
    EXPECT_EQ(TranscriptText(result), "sleep 3000\nsleep 0.0015\nsleep 7\n");
}

TEST(Harness, SleepsAreSleptWhenAskedFor)
{
    MACHINE machine = MachineMake();
    machine.fRealSleep = true;
    const RUN_RESULT result = MachineCall(machine, [] { EXPECT_EQ(usleep(200000), 0); });
    EXPECT_EQ(TranscriptText(result), "sleep 0.2\n");
    EXPECT_GE(result.seconds, 0.2);
}

TEST(Harness, AChosenCallFails)
{
    MACHINE machine = MachineMake();
    machine.faults = {{.szFunction = "access", .nCall = 2, .error = EACCES},
                      {.szFunction = "open", .nCall = 1, .error = EMFILE, .fGoOn = true}};
    const RUN_RESULT result = MachineCall(machine, [] {
        EXPECT_EQ(access("/tmp", F_OK), 0);
        EXPECT_EQ(access("/tmp", F_OK), -1);
        EXPECT_EQ(errno, EACCES);
        EXPECT_EQ(access("/tmp", F_OK), 0);
        EXPECT_EQ(open("/tmp", O_RDONLY), -1);
        EXPECT_EQ(open("/tmp", O_RDONLY), -1);
        EXPECT_EQ(errno, EMFILE);
    });
    EXPECT_EQ(TranscriptText(result), "fault access 2\nfault open 1\nfault open 2\n");
}

TEST(Harness, TheLogIsReadWithItsPriority)
{
    const RUN_RESULT result = MachineCall(MachineMake(), [] {
        syslog(LOG_ERR, "file.cpp:17 an error");
        syslog(LOG_DEBUG, "%s:%d a detail: %d", "other.cpp", 4711, 12);
        syslog(LOG_INFO, "no prefix");
    });
    EXPECT_EQ(LogText(result), "<11>file.cpp:# an error\n"
                               "<15>other.cpp:# a detail: 12\n"
                               "<14>no prefix\n");
}

TEST(Harness, LogLinesCommandsAndSleepsComeInOneOrder)
{
    MACHINE machine = MachineMake();
    machine.faults = {{.szFunction = "access"}};
    MachineTool(machine, "/sbin/mdadm -S", {.nTimes = 2});
    const RUN_RESULT result = MachineCall(machine, [] {
        syslog(LOG_ERR, "file.cpp:1 first");
        (void)sleep(1);
        EXPECT_EQ(SpaceExecl("/sbin/mdadm", "-S", nullptr), 0);
        syslog(LOG_DEBUG, "file.cpp:1 then");
        syslog(LOG_DEBUG, "file.cpp:1 again");
        EXPECT_EQ(access("/tmp", F_OK), -1);
        EXPECT_EQ(SpaceExecl("/sbin/mdadm", "-S", nullptr), 0);
        syslog(LOG_ERR, "file.cpp:1 last");
    });
    EXPECT_EQ(
        OrderText(result),
        Lines({"<11>file.cpp:# first", "sleep 1", "/sbin/mdadm -S", "<15>file.cpp:# then",
               "<15>file.cpp:# again", "fault access 1", "/sbin/mdadm -S", "<11>file.cpp:# last"}));
}

// Where the machine has no log, too.
TEST(Harness, WhatHappensIsToldWithoutALog)
{
    MACHINE machine = MachineMake();
    machine.fNoLog = true;
    const RUN_RESULT result = MachineCall(machine, [] {
        syslog(LOG_ERR, "file.cpp:1 heard by nobody");
        (void)sleep(1);
    });
    EXPECT_EQ(OrderText(result), "sleep 1\n");
}

TEST(Harness, TheTimeIsTheMachines)
{
    MachineCall(MachineMake(), [] {
        time_t now = 0;
        EXPECT_EQ(time(&now), 1793840523);
        EXPECT_EQ(now, 1793840523);
    });
}

TEST(Harness, ManyLogLinesDoNotBlockTheProgram)
{
    const RUN_RESULT result = MachineCall(MachineMake(), [] {
        for (int i = 0; i < 2000; i++) {
            syslog(LOG_ERR, "file.cpp:1 line");
        }
    });
    EXPECT_EQ(result.log.size(), 2000U);
}

TEST(Harness, TheHostCannotBeReached)
{
    MachineCall(MachineMake(), [] {
        EXPECT_NE(access("/usr", F_OK), -1);
        EXPECT_EQ(open("/usr/sandbox-was-here", O_WRONLY | O_CREAT, 0600), -1);
        EXPECT_EQ(errno, EROFS);
        EXPECT_EQ(access("/var/lib/dpkg/status", F_OK), -1);
        EXPECT_EQ(access("/dev/sda", F_OK), -1);
        EXPECT_EQ(access("/dev/vda", F_OK), -1);
        EXPECT_LT(getpid(), 10);
    });
}

TEST(Harness, EveryMachineStartsAnew)
{
    MACHINE machine = MachineMake();
    MachineFile(machine, "/tmp/deep/er/marker", "1");
    MachineFile(machine, "/dev/sda", "");
    MachineRun(machine, {"x"});
    EXPECT_EQ(MachineFileRead("/tmp/deep/er/marker"), "1");
    MachineRun(MachineMake(), {"x"});
    EXPECT_EQ(MachineFileRead("/tmp/deep/er/marker"), std::nullopt);
    EXPECT_EQ(MachineFileRead("/dev/sda"), std::nullopt);
}

TEST(Harness, ARunAgainFindsWhatTheFirstLeft)
{
    MACHINE machine = MachineMake();
    MachineRun(machine, {"enumformatalldisks"});
    EXPECT_EQ(MachineFileRead("/tmp/.not.dualhead"), "");
    const RUN_RESULT result = MachineRunAgain(machine, {"enumformatalldisks"});
    EXPECT_EQ(MachineFileRead("/tmp/.not.dualhead"), "");
    EXPECT_EQ(result.status, 0);
}

TEST(Harness, CommandsTellTheirSurroundings)
{
    MACHINE machine = MachineMake();
    machine.environment["SECRET"] = "1";
    MachineTool(machine, "/sbin/mdadm -Q", {.nTimes = 2});
    const RUN_RESULT result = MachineCall(machine, [] {
        const int fd = open("/proc/mounts", O_RDONLY);
        EXPECT_EQ(fcntl(fd, F_DUPFD, 20), 20);
        close(fd);
        EXPECT_EQ(NLIBCExecl("/sbin/mdadm", "-Q", nullptr), 0);
        close(20);
        EXPECT_EQ(SpaceExecl("/sbin/mdadm", "-Q", nullptr), 0);
    });
    ASSERT_EQ(result.events.size(), 2U);
    EXPECT_EQ(result.events[0].nDescriptors, 1);
    EXPECT_EQ(result.events[0].environment, std::vector<std::string>{"PATH=/sbin:/bin"});
    EXPECT_TRUE(result.events[0].fNullInput && result.events[0].fNullOutput &&
                result.events[0].fNullError);
    EXPECT_EQ(result.events[1].nDescriptors, 0);
    EXPECT_EQ(result.events[1].environment.size(), 2U);
    EXPECT_TRUE(result.events[1].fNullInput && result.events[1].fNullOutput);
    EXPECT_FALSE(result.events[1].fNullError);
}

// Other suites run tens of thousands of machines. Processor time, because the machine may be
// shared; a wide bound, because a build with sanitizers passes too.
TEST(Harness, ARunIsCheap)
{
    constexpr int RUNS = 100;
    constexpr double BOUND_SECONDS = 0.1;
    MACHINE machine = MachineMake();
    MachineMdAdd(machine, {.nMd = 2, .members = {{"sda3"}, {"sdb3"}}});
    const double before = ProcessorSeconds();
    for (int i = 0; i < RUNS; i++) {
        EXPECT_EQ(MachineRun(machine, {"status", "2"}).status, 0);
    }
    const double perRun = (ProcessorSeconds() - before) / RUNS;
    RecordProperty("milliseconds_per_run", std::to_string(perRun * 1000));
    EXPECT_LT(perRun, BOUND_SECONDS);
}
