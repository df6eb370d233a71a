// SPDX-License-Identifier: MIT
#include "nurostoragecore/space.h"

#include "last_error.h"
#include "nurocore/error.h"
#include "nurocore/types.h"
#include "sandbox.h"

#include <algorithm>
#include <cerrno>
#include <climits>
#include <csignal>
#include <cstdio>
#include <ctime>
#include <gtest/gtest.h>
#include <linux/close_range.h>
#include <optional>
#include <string>
#include <unistd.h>
#include <vector>

namespace
{

constexpr char LOG_PATH[] = "/var/log/space_operation_error.log";
constexpr char OPEN_FAILED[] = "<11>space.cpp:# Fail to open /var/log/space_operation_error.log\n";
constexpr char STAMP_FORMAT[] = "%b %d %H:%M:%S";
constexpr size_t STAMP_LENGTH = 15;
constexpr size_t LINE_LENGTH = 2047;

// "Nov 05 07:08:09": what is read as a time and written again is the same text.
bool IsStamp(const std::string &text)
{
    struct tm fields = {};
    const char *const pEnd = strptime(text.c_str(), STAMP_FORMAT, &fields);
    char szAgain[32] = "";
    (void)strftime(szAgain, sizeof(szAgain), STAMP_FORMAT, &fields);
    return pEnd != nullptr && *pEnd == '\0' && text == szAgain;
}

// The lines of the error log without their time stamps, whose shape is checked here.
std::vector<std::string> LinesOf(const std::optional<std::string> &log)
{
    std::vector<std::string> lines;
    const std::string text = log.value_or("");
    size_t start = 0;
    for (size_t end = text.find('\n'); end != std::string::npos; end = text.find('\n', start)) {
        EXPECT_TRUE(IsStamp(text.substr(start, STAMP_LENGTH))) << text;
        const std::string line = text.substr(start, end - start);
        lines.push_back(line.size() < STAMP_LENGTH ? line : line.substr(STAMP_LENGTH));
        start = end + 1;
    }
    EXPECT_EQ(start, text.size()) << "the log ends within a line";
    return lines;
}

std::vector<std::string> LinesOfLog()
{
    return LinesOf(MachineFileRead(LOG_PATH));
}

std::string Line(const std::string &command, const std::string &error)
{
    return " command=\"" + command + "\" Error=\"" + error + "\"";
}

using LINES = std::vector<std::string>;

// The text as a stream that ends.
FILE *StreamOf(std::string &text)
{
    return text.empty() ? fopen("/dev/null", "r") : fmemopen(text.data(), text.size(), "r");
}

RUN_RESULT ErrorLogOf(std::string text, const char *szCommand)
{
    return MachineCall(MachineMake(), [&text, szCommand] {
        FILE *const pStream = StreamOf(text);
        RecordReset();
        EXPECT_EQ(SpaceErrorLog(pStream, szCommand), 0);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
        fclose(pStream);
    });
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
        const RUN_RESULT result = ErrorLogOf(row.text, row.szCommand);
        EXPECT_EQ(LinesOfLog(), LINES{row.line});
        EXPECT_EQ(LogText(result), "");
    }
}

TEST(SpaceErrorLog, LeavesTheLogAloneWhenThereIsNothing)
{
    const RUN_RESULT result = ErrorLogOf("", "/sbin/x");
    EXPECT_EQ(MachineFileRead(LOG_PATH), std::nullopt);
    EXPECT_EQ(LogText(result), "");

    MACHINE machine = MachineMake();
    MachineFile(machine, LOG_PATH, "older");
    (void)MachineCall(machine, [] {
        FILE *const pStream = fopen("/dev/null", "r");
        EXPECT_EQ(SpaceErrorLog(pStream, "/sbin/x"), 0);
        fclose(pStream);
    });
    EXPECT_EQ(MachineFileRead(LOG_PATH), "older");
}

TEST(SpaceErrorLog, KeepsWhatTheLogHolds)
{
    MACHINE machine = MachineMake();
    const std::string older = "Jan 01 00:00:00 older\n";
    MachineFile(machine, LOG_PATH, older);
    const RUN_RESULT result = MachineCall(machine, [] {
        for (std::string text : {"first\n", "second\n"}) {
            FILE *const pStream = StreamOf(text);
            EXPECT_EQ(SpaceErrorLog(pStream, "/sbin/x"), 0);
            fclose(pStream);
        }
    });
    EXPECT_EQ(MachineFileRead(LOG_PATH).value_or("").substr(0, older.size()), older);
    EXPECT_EQ(LinesOfLog(),
              (LINES{" older", Line("/sbin/x", "first "), Line("/sbin/x", "second ")}));
    EXPECT_EQ(LogText(result), "");
}

// Stamp, words and quotes take 35 bytes of the 2047; what the line has no room for is cut from its
// end, and the line end comes on top.
TEST(SpaceErrorLog, CutsTheLine)
{
    for (const size_t cch : {2000U, 2008U, 2009U, 2010U, 2046U, 2047U, 2048U, 2049U, 5000U}) {
        SCOPED_TRACE(cch);
        const RUN_RESULT result = ErrorLogOf(std::string(cch, 'e'), "cmd");
        const std::string whole = Line("cmd", std::string(cch, 'e'));
        EXPECT_EQ(LinesOfLog(), LINES{whole.substr(0, LINE_LENGTH - STAMP_LENGTH)});
        EXPECT_EQ(MachineFileRead(LOG_PATH).value_or("").size(),
                  std::min(STAMP_LENGTH + whole.size(), LINE_LENGTH) + 1);
        EXPECT_EQ(LogText(result), "");
    }
}

TEST(SpaceErrorLog, CutsTheLineWithinTheCommandToo)
{
    const std::string command(3000, 'c');
    (void)ErrorLogOf("error\n", command.c_str());
    EXPECT_EQ(LinesOfLog(), LINES{Line(command, "").substr(0, LINE_LENGTH - STAMP_LENGTH)});
}

TEST(SpaceErrorLog, ReadsTheStreamToItsEnd)
{
    std::string text(100000, 'e');
    (void)MachineCall(MachineMake(), [&text] {
        FILE *const pStream = StreamOf(text);
        EXPECT_EQ(SpaceErrorLog(pStream, "/sbin/x"), 0);
        EXPECT_EQ(ftell(pStream), 100000);
        EXPECT_NE(feof(pStream), 0);
        fclose(pStream);
    });
    EXPECT_EQ(LinesOfLog().size(), 1U);
}

TEST(SpaceErrorLog, RefusesNoStream)
{
    const RUN_RESULT result = MachineCall(MachineMake(), [] {
        RecordReset();
        EXPECT_EQ(SpaceErrorLog(nullptr, "/sbin/x"), -1);
        EXPECT_EQ(NLIBCErrGet(), ERR_BAD_PARAMETER);
        EXPECT_STREQ(NLIBCErrGetFile(), "space.cpp");
    });
    EXPECT_EQ(MachineFileRead(LOG_PATH), std::nullopt);
    EXPECT_EQ(LogText(result), "");
}

// Why the log cannot be opened.
std::vector<MACHINE> MachinesWithoutLog()
{
    MACHINE noFolder = MachineMake();
    MachineRemove(noFolder, "/var/log");
    MACHINE isFolder = MachineMake();
    MachineFolder(isFolder, LOG_PATH);
    MACHINE refused = MachineMake();
    refused.faults = {{.szFunction = "fopen", .error = EACCES}};
    return {noFolder, isFolder, refused};
}

TEST(SpaceErrorLog, FailsWithoutACodeWhenTheLogDoesNotOpen)
{
    for (const MACHINE &machine : MachinesWithoutLog()) {
        std::string text = "error\n";
        const RUN_RESULT result = MachineCall(machine, [&text] {
            FILE *const pStream = StreamOf(text);
            RecordReset();
            EXPECT_EQ(SpaceErrorLog(pStream, "/sbin/x"), -1);
            EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
            EXPECT_NE(feof(pStream), 0);
            fclose(pStream);
        });
        EXPECT_EQ(LogText(result), OPEN_FAILED);
    }
}

// ---- the time stamp ----------------------------------------------------------------------------

std::string StampAt(time_t when, int minutesEast)
{
    const time_t shifted = when + minutesEast * 60;
    struct tm fields = {};
    gmtime_r(&shifted, &fields);
    char szStamp[32] = "";
    (void)strftime(szStamp, sizeof(szStamp), STAMP_FORMAT, &fields);
    return szStamp;
}

struct ZONE_CASE {
    const char *szZone;
    int minutesEast;
};

constexpr ZONE_CASE ZONE_CASES[] = {{"UTC0", 0}, {"WST+11:30", -690}, {"EST-13:45", 825}};

TEST(SpaceErrorLog, StampsTheLineWithTheLocalTime)
{
    for (const ZONE_CASE &row : ZONE_CASES) {
        SCOPED_TRACE(row.szZone);
        MACHINE machine = MachineMake();
        machine.environment["TZ"] = row.szZone;
        std::string text = "error";
        const time_t before = time(nullptr);
        (void)MachineCall(machine, [&text] {
            tzset();
            FILE *const pStream = StreamOf(text);
            EXPECT_EQ(SpaceErrorLog(pStream, "/sbin/x"), 0);
            fclose(pStream);
        });
        const time_t after = time(nullptr);
        bool fLocal = false;
        const std::string log = MachineFileRead(LOG_PATH).value_or("");
        for (time_t when = before; when <= after; when++) {
            fLocal = fLocal || log.starts_with(StampAt(when, row.minutesEast) + " command=");
        }
        EXPECT_TRUE(fLocal) << log << "expected " << StampAt(before, row.minutesEast);
    }
}

// ---- running a tool ----------------------------------------------------------------------------

struct STATUS_CASE {
    TOOL_ANSWER answer;
    int status; // as wait gives it
    LINES lines;
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
    {{.szErr = "mdadm: fail to stop\n", .status = 1},
     256,
     {Line("/sbin/mdadm -S /dev/md2", "mdadm: fail to stop ")}},
    {{.szErr = "mdadm: stopped /dev/md2\n"},
     0,
     {Line("/sbin/mdadm -S /dev/md2", "mdadm: stopped /dev/md2 ")}},
    {{.szOut = "out\n", .szErr = "one\ntwo\n", .status = 3},
     768,
     {Line("/sbin/mdadm -S /dev/md2", "one two ")}},
    {{.szErr = "going down", .signal = SIGKILL},
     SIGKILL,
     {Line("/sbin/mdadm -S /dev/md2", "going down")}},
    {{.szErr = "late\n", .msDelay = 50}, 0, {Line("/sbin/mdadm -S /dev/md2", "late ")}},
};

TEST(SpaceExecl, ReturnsTheRawStatusAndLogsStandardError)
{
    for (const STATUS_CASE &row : STATUS_CASES) {
        SCOPED_TRACE(testing::Message() << row.status << ' ' << row.answer.szErr);
        MACHINE machine = MachineMake();
        MachineTool(machine, "/sbin/mdadm -S /dev/md2", row.answer);
        const RUN_RESULT result = MachineCall(machine, [&row] {
            RecordReset();
            EXPECT_EQ(SpaceExecl("/sbin/mdadm", "-S", "/dev/md2", NULL), row.status);
            EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
        });
        EXPECT_EQ(LinesOfLog(), row.lines);
        EXPECT_EQ(MachineFileRead(LOG_PATH).has_value(), !row.lines.empty());
        EXPECT_EQ(TranscriptText(result), "/sbin/mdadm -S /dev/md2\n");
        EXPECT_EQ(LogText(result), "");
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

void ExpectLoggedWithBlanksAndRunAsItIs(const COMMAND_CASE &row)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, row.argv, {.szErr = "x"});
    const RUN_RESULT result =
        MachineCall(machine, [&row] { EXPECT_EQ(SpaceExeclOf(row.argv), 0); });
    EXPECT_EQ(LinesOfLog(), LINES{Line(row.text, "x")});
    ASSERT_EQ(result.events.size(), 1U);
    EXPECT_EQ(result.events[0].argv, row.argv);
}

TEST(SpaceExecl, LogsTheCommandWithBlanksAndRunsItAsItIs)
{
    for (const COMMAND_CASE &row : COMMAND_CASES) {
        SCOPED_TRACE(row.text);
        ExpectLoggedWithBlanksAndRunAsItIs(row);
    }
}

TEST(SpaceExecl, CutsLongCommandAndLongErrorInOneLine)
{
    const std::vector<std::string> argv = {"/sbin/mdadm", std::string(2000, 'a')};
    MACHINE machine = MachineMake();
    MachineTool(machine, argv, {.szErr = std::string(4000, 'e') + "\n", .status = 1});
    (void)MachineCall(machine, [&argv] { EXPECT_EQ(SpaceExeclOf(argv), 256); });
    const std::string whole = Line("/sbin/mdadm " + std::string(1011, 'a'), std::string(2047, 'e'));
    EXPECT_EQ(LinesOfLog(), LINES{whole.substr(0, LINE_LENGTH - STAMP_LENGTH)});
}

TEST(SpaceExecl, ReadsAFloodWithoutBlockingTheTool)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, "/sbin/mdadm -S", {.status = 1, .cbFlood = 10485760});
    const RUN_RESULT result =
        MachineCall(machine, [] { EXPECT_EQ(SpaceExecl("/sbin/mdadm", "-S", NULL), 256); });
    const std::string whole = Line("/sbin/mdadm -S", std::string(2047, 'x'));
    EXPECT_EQ(LinesOfLog(), LINES{whole.substr(0, LINE_LENGTH - STAMP_LENGTH)});
    EXPECT_EQ(LogText(result), "");
}

TEST(SpaceExecl, LogsALineForEachToolThatWroteAnError)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, "/sbin/vgremove -f vg1", {.szErr = "first\n", .status = 5});
    MachineTool(machine, "/sbin/pvremove /dev/md2", {.status = 5});
    MachineTool(machine, "/sbin/mdadm -S /dev/md2", {.szErr = "third\n"});
    (void)MachineCall(machine, [] {
        EXPECT_EQ(SpaceExecl("/sbin/vgremove", "-f", "vg1", NULL), 1280);
        EXPECT_EQ(SpaceExecl("/sbin/pvremove", "/dev/md2", NULL), 1280);
        EXPECT_EQ(SpaceExecl("/sbin/mdadm", "-S", "/dev/md2", NULL), 0);
    });
    EXPECT_EQ(LinesOfLog(), (LINES{Line("/sbin/vgremove -f vg1", "first "),
                                   Line("/sbin/mdadm -S /dev/md2", "third ")}));
}

TEST(SpaceExecl, GivesStatus127OfAToolThatCannotRun)
{
    for (const TOOL_KIND kind :
         {TOOL_KIND::MISSING, TOOL_KIND::FOLDER, TOOL_KIND::NOT_EXECUTABLE}) {
        SCOPED_TRACE(static_cast<int>(kind));
        MACHINE machine = MachineMake();
        machine.tools["/sbin/mdadm"] = kind;
        const RUN_RESULT result = MachineCall(machine, [] {
            RecordReset();
            EXPECT_EQ(SpaceExecl("/sbin/mdadm", "-S", "/dev/md2", NULL), 32512);
            EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
        });
        EXPECT_EQ(MachineFileRead(LOG_PATH), std::nullopt);
        EXPECT_EQ(LogText(result), "");
    }
}

TEST(SpaceExecl, JudgesByTheToolWhenTheLogDoesNotOpen)
{
    for (MACHINE machine : MachinesWithoutLog()) {
        for (const int status : {0, 1}) {
            machine.rows.clear();
            MachineTool(machine, "/sbin/mdadm -S", {.szErr = "error\n", .status = status});
            const RUN_RESULT result = MachineCall(machine, [status] {
                RecordReset();
                EXPECT_EQ(SpaceExecl("/sbin/mdadm", "-S", NULL), status * 256);
                EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
            });
            EXPECT_EQ(LogText(result), OPEN_FAILED);
        }
    }
}

TEST(SpaceExecl, RefusesNull)
{
    const RUN_RESULT result = MachineCall(MachineMake(), [] {
        RecordReset();
        EXPECT_EQ(SpaceExecl(nullptr, "-S", NULL), -1);
        EXPECT_EQ(NLIBCErrGet(), ERR_BAD_PARAMETER);
        EXPECT_STREQ(NLIBCErrGetFile(), "space.cpp");
    });
    EXPECT_EQ(LogText(result), "");
    EXPECT_EQ(TranscriptText(result), "");
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
        MACHINE machine = MachineMake();
        MachineTool(machine, "/sbin/mdadm -S", {.status = 1, .nTimes = ANY_TIMES});
        machine.faults = {{.szFunction = row.szFunction, .error = row.error}};
        machine.fMayLeaveChildren = true;
        const RUN_RESULT result = MachineCall(machine, [&row] {
            RecordReset();
            EXPECT_EQ(SpaceExecl("/sbin/mdadm", "-S", NULL), row.result);
            EXPECT_EQ(NLIBCErrGet(), row.code);
        });
        EXPECT_EQ(MachineFileRead(LOG_PATH), std::nullopt);
        EXPECT_EQ(LogText(result), "");
    }
}

} // namespace
