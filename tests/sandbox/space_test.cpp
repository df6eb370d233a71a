// SPDX-License-Identifier: MIT
#include "nurostoragecore/space.h"

#include "nurocore/error.h"
#include "nurocore/types.h"
#include "steps.h"

#include <cerrno>
#include <climits>
#include <csignal>
#include <cstdio>
#include <gtest/gtest.h>
#include <linux/close_range.h>
#include <optional>
#include <string>
#include <unistd.h>
#include <vector>

namespace
{

constexpr char LOG_PATH[] = "/var/log/space_operation_error.log";
constexpr char OPEN_FAILED[] = "<11>space.cpp:# Fail to open /var/log/space_operation_error.log";
constexpr size_t LINE_LENGTH = 2047;

// A line as long as it may be; its end is cut.
std::string CutLine(const std::string &line)
{
    return line.substr(0, LINE_LENGTH) + "\n";
}

std::string Line(const std::string &command, const std::string &error)
{
    return "Nov 05 01:02:03 command=\"" + command + "\" Error=\"" + error + "\"\n";
}

// Logs what a stream with the text says.
int ErrorLogOf(std::string text, const char *szCommand)
{
    FILE *const pStream =
        text.empty() ? fopen("/dev/null", "r") : fmemopen(text.data(), text.size(), "r");
    const int result = SpaceErrorLog(pStream, szCommand);
    EXPECT_NE(feof(pStream), 0);
    (void)fclose(pStream);
    return result;
}

// The machine's log after that, which succeeds.
std::optional<std::string> LogAfter(const std::string &text, const char *szCommand,
                                    const MACHINE &machine = MachineMake())
{
    (void)ExpectCall({.szName = "the log", .machine = machine, .call = [&] {
                          return ErrorLogOf(text, szCommand);
                      }});
    return MachineFileRead(LOG_PATH);
}

// ---- the log line ------------------------------------------------------------------------------

struct LINE_CASE {
    std::string text;
    const char *szCommand;
    std::string line;
};

const LINE_CASE LINE_CASES[] = {
    {"error", "/sbin/x", " command=\"/sbin/x\" Error=\"error\""},
    {"error\n", "/sbin/x -a", " command=\"/sbin/x -a\" Error=\"error \""},
    {"one\ntwo\n", "/sbin/x", " command=\"/sbin/x\" Error=\"one two \""},
    {"\n", "/sbin/x", " command=\"/sbin/x\" Error=\" \""},
    {"\n\n a\n\nb", "/sbin/x", " command=\"/sbin/x\" Error=\"   a  b\""},
    {" ", "/sbin/x", " command=\"/sbin/x\" Error=\" \""},
    {"a\r\n\tb", "/sbin/x", " command=\"/sbin/x\" Error=\"a\r \tb\""},
    {"100%s %n%d", "/sbin/%s %n", " command=\"/sbin/%s %n\" Error=\"100%s %n%d\""},
    {"\xc3\xa4\xff", "/sbin/x", " command=\"/sbin/x\" Error=\"\xc3\xa4\xff\""},
    {"say \"no\"", "/sbin/x \"a\" '", " command=\"/sbin/x \"a\" '\" Error=\"say \"no\"\""},
    {"error", "", " command=\"\" Error=\"error\""},
    {"error", nullptr, " command=\"\" Error=\"error\""},
};

TEST(SpaceErrorLog, AppendsOneLine)
{
    for (const LINE_CASE &row : LINE_CASES) {
        SCOPED_TRACE(row.line);
        EXPECT_EQ(LogAfter(row.text, row.szCommand), "Nov 05 01:02:03" + row.line + "\n");
    }
}

TEST(SpaceErrorLog, LeavesTheLogAloneWhenThereIsNothing)
{
    EXPECT_EQ(LogAfter("", "/sbin/x"), std::nullopt);
    EXPECT_EQ(LogAfter("", "/sbin/x", WithFile(MachineMake(), LOG_PATH, "older")), "older");
}

TEST(SpaceErrorLog, KeepsWhatTheLogHolds)
{
    EXPECT_EQ(LogAfter("new\n", "/sbin/x", WithFile(MachineMake(), LOG_PATH, "older\n")),
              "older\nNov 05 01:02:03 command=\"/sbin/x\" Error=\"new \"\n");
}

// Stamp, words and quotes take 35 bytes of the 2047; what the line has no room for is cut from its
// end, and the line end comes on top.
TEST(SpaceErrorLog, CutsTheLine)
{
    for (const size_t cch : {2000U, 2008U, 2009U, 2010U, 2046U, 2047U, 2048U, 2049U, 5000U}) {
        SCOPED_TRACE(cch);
        const std::string line = Line("cmd", std::string(cch, 'e'));
        EXPECT_EQ(LogAfter(std::string(cch, 'e'), "cmd"), cch <= 2009 ? line : CutLine(line));
    }
    const std::string command(3000, 'c');
    EXPECT_EQ(LogAfter("error\n", command.c_str()), CutLine(Line(command, "")));
}

TEST(SpaceErrorLog, ReadsTheStreamToItsEnd)
{
    EXPECT_EQ(LogAfter(std::string(100000, 'e'), "").value_or("").size(), LINE_LENGTH + 1);
}

// Why the log cannot be opened.
std::vector<MACHINE> MachinesWithoutLog()
{
    const MACHINE machine = MachineMake();
    return {Without(machine, "/var/log"), WithFile(machine, std::string(LOG_PATH) + "/file", ""),
            WithFault(machine, {.szFunction = "fopen", .error = EACCES})};
}

// The fault is told where it is one.
STEPS OpenFailed(const MACHINE &machine)
{
    return (machine.faults.empty() ? STEPS{} : STEPS{{"fault fopen 1"}}) + STEPS{{OPEN_FAILED}};
}

TEST(SpaceErrorLog, FailsWithoutACodeWhenTheLogDoesNotOpen)
{
    for (const MACHINE &machine : MachinesWithoutLog()) {
        (void)ExpectCall({.szName = "no log",
                          .machine = machine,
                          .call = [] { return ErrorLogOf("error\n", "/sbin/x"); },
                          .result = -1,
                          .steps = OpenFailed(machine)});
    }
}

// ---- the time stamp ----------------------------------------------------------------------------

struct STAMP_CASE {
    std::int64_t when;
    const char *szZone;
    const char *szLog;
};

// A day has two digits on every day, and the place of the machine counts.
constexpr STAMP_CASE STAMP_CASES[] = {
    {1793840523, "UTC0", "Nov 05 01:02:03 command=\"x\" Error=\"e\"\n"},
    {1793840523, "WST+11:30", "Nov 04 13:32:03 command=\"x\" Error=\"e\"\n"},
    {1793840523, "EST-13:45", "Nov 05 14:47:03 command=\"x\" Error=\"e\"\n"},
    {1772323199, "UTC0", "Feb 28 23:59:59 command=\"x\" Error=\"e\"\n"},
    {1767225600, "UTC0", "Jan 01 00:00:00 command=\"x\" Error=\"e\"\n"},
    {1781049600, "UTC0", "Jun 10 00:00:00 command=\"x\" Error=\"e\"\n"},
};

TEST(SpaceErrorLog, StampsTheLineWithTheLocalTime)
{
    for (const STAMP_CASE &row : STAMP_CASES) {
        SCOPED_TRACE(row.szLog);
        MACHINE machine = MachineMake();
        machine.when = row.when;
        machine.environment["TZ"] = row.szZone;
        EXPECT_EQ(LogAfter("e", "x", machine), row.szLog);
    }
}

// The time stamp is for people; without one the line is there all the same.
TEST(SpaceErrorLog, LogsWithoutATimeToo)
{
    for (const std::string szFunction : {"localtime_r", "strftime"}) {
        (void)ExpectCall({.szName = szFunction.c_str(),
                          .machine = WithFault(MachineMake(), {.szFunction = szFunction}),
                          .call = [] { return ErrorLogOf("e", "x"); },
                          .steps = {{"fault " + szFunction + " 1"}}});
        EXPECT_EQ(MachineFileRead(LOG_PATH), " command=\"x\" Error=\"e\"\n");
    }
}

// ---- running a tool ----------------------------------------------------------------------------

constexpr char STOP[] = "/sbin/mdadm -S /dev/md2";

long long Stop()
{
    return SpaceExecl("/sbin/mdadm", "-S", "/dev/md2", NULL);
}

struct STATUS_CASE {
    TOOL_ANSWER answer;
    int status; // as wait gives it
    std::optional<std::string> log;
};

const STATUS_CASE STATUS_CASES[] = {
    {{}, 0, {}},
    {{.status = 1}, 256, {}},
    {{.status = 2}, 512, {}},
    {{.status = 255}, 65280, {}},
    {{.signal = SIGKILL}, SIGKILL, {}},
    {{.signal = SIGTERM}, SIGTERM, {}},
    // What goes to standard output is nobody's.
    {{.szOut = "stopped /dev/md2\n"}, 0, {}},
    // What goes to standard error is logged, whatever the status.
    {{.szErr = "fail to stop\n", .status = 1}, 256, Line(STOP, "fail to stop ")},
    {{.szErr = "stopped /dev/md2\n"}, 0, Line(STOP, "stopped /dev/md2 ")},
    {{.szOut = "out\n", .szErr = "one\ntwo\n", .status = 3}, 768, Line(STOP, "one two ")},
    {{.szErr = "going down", .signal = SIGKILL}, SIGKILL, Line(STOP, "going down")},
    {{.szErr = "late\n", .msDelay = 50}, 0, Line(STOP, "late ")},
    // However much it is, and nobody waits.
    {{.status = 1, .cbFlood = 10485760}, 256, CutLine(Line(STOP, std::string(2047, 'x')))},
};

TEST(SpaceExecl, ReturnsTheRawStatusAndLogsStandardError)
{
    for (const STATUS_CASE &row : STATUS_CASES) {
        SCOPED_TRACE(testing::Message() << row.status << ' ' << row.answer.szErr);
        const RUN_RESULT result = ExpectCall(
            {.szName = "stop", .call = Stop, .result = row.status, .steps = {{STOP, row.answer}}});
        EXPECT_EQ(MachineFileRead(LOG_PATH), row.log);
        EXPECT_EQ(result.szOut, "");
        EXPECT_EQ(result.szErr, "");
    }
}

TEST(SpaceExecl, GivesTheToolNothingButItsStandardError)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, "/sbin/mdadm");
    const RUN_RESULT result = MachineCall(machine, [] {
        // Whoever started the tests may have left descriptors open; they are not what is counted.
        (void)close_range(STDERR_FILENO + 1, UINT_MAX, CLOSE_RANGE_CLOEXEC);
        EXPECT_EQ(SpaceExecl("/sbin/mdadm", NULL), 0);
    });
    ASSERT_EQ(result.events.size(), 1U);
    EXPECT_EQ(result.events[0].szExecuted, "/sbin/mdadm");
    EXPECT_EQ(result.events[0].argv, std::vector<std::string>{"/sbin/mdadm"});
    EXPECT_TRUE(result.events[0].fNullInput);
    EXPECT_TRUE(result.events[0].fNullOutput);
    EXPECT_FALSE(result.events[0].fNullError);
    EXPECT_EQ(result.events[0].nDescriptors, 0);
}

struct COMMAND_CASE {
    std::vector<std::string> argv;
    std::string text;
};

const COMMAND_CASE COMMAND_CASES[] = {
    {{"/sbin/mdadm"}, "/sbin/mdadm"},
    {{"/sbin/mdadm", "-S"}, "/sbin/mdadm -S"},
    {{"/sbin/mdadm", "a b", "c"}, "/sbin/mdadm a b c"},
    {{"/sbin/mdadm", "", "-N3"}, "/sbin/mdadm  -N3"},
    {{"/sbin/mdadm", "-N3", "", "-uS"}, "/sbin/mdadm -N3  -uS"},
    {{"/sbin/mdadm", "-N3", ""}, "/sbin/mdadm -N3 "},
    {{"/sbin/mdadm", "", ""}, "/sbin/mdadm  "},
    {{"/sbin/mdadm", " "}, "/sbin/mdadm  "},
    {{"/sbin/mdadm", "say \"a\"", "'b'"}, "/sbin/mdadm say \"a\" 'b'"},
    {{"/sbin/mdadm", "%s", "%n", "a;b", "$(c)", "*"}, "/sbin/mdadm %s %n a;b $(c) *"},
    // 1023 bytes of text, and not one of the tool's arguments less: path and blank are 12.
    {{"/sbin/mdadm", std::string(1010, 'a')}, "/sbin/mdadm " + std::string(1010, 'a')},
    {{"/sbin/mdadm", std::string(1011, 'a')}, "/sbin/mdadm " + std::string(1011, 'a')},
    {{"/sbin/mdadm", std::string(1012, 'a')}, "/sbin/mdadm " + std::string(1011, 'a')},
    {{"/sbin/mdadm", std::string(3000, 'a'), "-z"}, "/sbin/mdadm " + std::string(1011, 'a')},
    {{"/sbin/mdadm", std::string(1009, 'a'), "bc"}, "/sbin/mdadm " + std::string(1009, 'a') + " b"},
    // Cut behind a blank: the blank goes as well.
    {{"/sbin/mdadm", std::string(1010, 'a'), "b", "c"}, "/sbin/mdadm " + std::string(1010, 'a')},
    {{"/sbin/mdadm", std::string(1009, 'a'), "", "b"},
     "/sbin/mdadm " + std::string(1009, 'a') + " "},
};

int SpaceExeclOf(const std::vector<std::string> &argv)
{
    const auto arg = [&argv](size_t i) { return i < argv.size() ? argv[i].c_str() : nullptr; };
    return SpaceExecl(arg(0), arg(1), arg(2), arg(3), arg(4), arg(5), arg(6), NULL);
}

// How a tool with this answer ends that is run as it is.
void ExpectRunAsItIs(const std::vector<std::string> &argv, const TOOL_ANSWER &answer, int status)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, argv, answer);
    const RUN_RESULT result =
        MachineCall(machine, [&argv, status] { EXPECT_EQ(SpaceExeclOf(argv), status); });
    ASSERT_EQ(result.events.size(), 1U);
    EXPECT_EQ(result.events[0].argv, argv);
}

TEST(SpaceExecl, LogsTheCommandWithBlanksAndRunsItAsItIs)
{
    for (const COMMAND_CASE &row : COMMAND_CASES) {
        SCOPED_TRACE(row.text);
        ExpectRunAsItIs(row.argv, {.szErr = "x"}, 0);
        EXPECT_EQ(MachineFileRead(LOG_PATH), Line(row.text, "x"));
    }
}

TEST(SpaceExecl, CutsLongCommandAndLongErrorInOneLine)
{
    ExpectRunAsItIs({"/sbin/mdadm", std::string(2000, 'a')},
                    {.szErr = std::string(4000, 'e') + "\n", .status = 1}, 256);
    EXPECT_EQ(MachineFileRead(LOG_PATH),
              CutLine(Line("/sbin/mdadm " + std::string(1011, 'a'), std::string(2047, 'e'))));
}

TEST(SpaceExecl, LogsALineForEachToolThatWroteAnError)
{
    (void)ExpectCall({.szName = "three tools",
                      .call =
                          [] {
                              EXPECT_EQ(SpaceExecl("/sbin/vgremove", "-f", "vg1", NULL), 1280);
                              EXPECT_EQ(SpaceExecl("/sbin/pvremove", "/dev/md2", NULL), 1280);
                              return Stop();
                          },
                      .steps = {{"/sbin/vgremove -f vg1", {.szErr = "first\n", .status = 5}},
                                {"/sbin/pvremove /dev/md2", {.status = 5}},
                                {STOP, {.szErr = "third\n"}}}});
    EXPECT_EQ(MachineFileRead(LOG_PATH),
              Line("/sbin/vgremove -f vg1", "first ") + Line(STOP, "third "));
}

TEST(SpaceExecl, GivesStatus127OfAToolThatCannotRun)
{
    for (const TOOL_KIND kind :
         {TOOL_KIND::MISSING, TOOL_KIND::FOLDER, TOOL_KIND::NOT_EXECUTABLE}) {
        SCOPED_TRACE(static_cast<int>(kind));
        (void)ExpectCall({.szName = "no tool",
                          .machine = WithTool(MachineMake(), "/sbin/mdadm", kind),
                          .call = Stop,
                          .result = 32512});
        EXPECT_EQ(MachineFileRead(LOG_PATH), std::nullopt);
    }
}

TEST(SpaceExecl, JudgesByTheToolWhenTheLogDoesNotOpen)
{
    for (const MACHINE &machine : MachinesWithoutLog()) {
        for (const int status : {0, 1}) {
            (void)ExpectCall({.szName = "no log",
                              .machine = machine,
                              .call = Stop,
                              .result = status * 256,
                              .steps = STEPS{{STOP, {.szErr = "error\n", .status = status}}} +
                                       OpenFailed(machine)});
        }
    }
}

TEST(Space, RefusesNull)
{
    IdleCall(MachineMake(), [] {
        const char *const argv[] = {nullptr};
        EXPECT_FAILS(SpaceErrorLog(nullptr, "/sbin/x"), -1, ERR_BAD_PARAMETER);
        EXPECT_FAILS(SpaceExecl(nullptr, "-S", NULL), -1, ERR_BAD_PARAMETER);
        EXPECT_FAILS(SpaceExecv(nullptr), -1, ERR_BAD_PARAMETER);
        EXPECT_FAILS(SpaceExecv(argv), -1, ERR_BAD_PARAMETER);
    });
}

struct FAULT_CASE {
    const char *szFunction;
    int error;
    int result;
    u32 code;
};

// Without a stream both the log and the close are asked for nothing, and the record says so.
constexpr FAULT_CASE FAULT_CASES[] = {
    {"pipe2", EMFILE, -1, ERR_BAD_PARAMETER},   {"fork", EAGAIN, -1, ERR_BAD_PARAMETER},
    {"fdopen", ENOMEM, -1, ERR_BAD_PARAMETER},  {"calloc", ENOMEM, -1, OLD_CODE},
    {"waitpid", EINVAL, -1, ERR_NO_SUCH_CHILD}, {"waitpid", ECHILD, 0, OLD_CODE},
    {"waitpid", EINTR, 256, OLD_CODE},
};

TEST(SpaceExecl, FailsWhenTheToolCannotBeStartedOrWaitedFor)
{
    for (const FAULT_CASE &row : FAULT_CASES) {
        SCOPED_TRACE(testing::Message() << row.szFunction << ' ' << row.error);
        MACHINE machine =
            WithFault(MachineMake(), {.szFunction = row.szFunction, .error = row.error});
        MachineTool(machine, STOP, {.status = 1, .nTimes = ANY_TIMES});
        machine.fMayLeaveChildren = true;
        QuietCall(machine, [&row] { EXPECT_FAILS(Stop(), row.result, row.code); });
        EXPECT_EQ(MachineFileRead(LOG_PATH), std::nullopt);
    }
}

} // namespace
