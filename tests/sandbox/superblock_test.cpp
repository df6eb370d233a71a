// SPDX-License-Identifier: MIT
#include "nurostoragecore/raid_superblock.h"

#include "removal_machine.h"
#include "streams.h"

#include <cerrno>
#include <csignal>
#include <fstream>
#include <gtest/gtest.h>
#include <iterator>
#include <string>
#include <syslog.h>

namespace
{

// ---- one line ----------------------------------------------------------------------------------

// What a line does not say must stay as it was.
constexpr RAID_SUPERBLOCK BEFORE = {71, 72, "old uuid", "old path", 73, 74, 75, 76};

template <class VALUE>
std::string Change(const char *szName, const VALUE &value, const VALUE &before)
{
    return value == before ? "" : (testing::Message() << szName << value << ", ").GetString();
}

// What differs from the record as it was before, as "level 4, role 1, ".
std::string Changes(const RAID_SUPERBLOCK &after, const RAID_SUPERBLOCK &before = BEFORE)
{
    return Change("major ", after.majorVersion, before.majorVersion) +
           Change("minor ", after.minorVersion, before.minorVersion) +
           Change("uuid ", std::string(after.szUuid), std::string(before.szUuid)) +
           Change("", std::string(after.szMdPath), std::string(before.szMdPath)) +
           Change("level ", after.level, before.level) +
           Change("devices ", after.nRaidDevices, before.nRaidDevices) +
           Change("role ", after.deviceRole, before.deviceRole) +
           Change("events ", after.events, before.events);
}

struct LINE_CASE {
    std::string szLine;
    std::string szChanges = {};
    STEPS told = {}; // of one that fails
};

void ExpectLines(const std::vector<LINE_CASE> &cases)
{
    STEPS told;
    for (const LINE_CASE &row : cases) {
        told = told + row.told;
    }
    const RUN_RESULT result = MachineCall(MachineMake(), [&cases] {
        for (const LINE_CASE &row : cases) {
            SCOPED_TRACE(row.szLine);
            std::string szLine = row.szLine;
            RAID_SUPERBLOCK superblock = BEFORE;
            EXPECT_QUIET(RAIDSuperblockLineParse(szLine.data(), &superblock),
                         row.told.empty() ? 0 : -1);
            EXPECT_EQ(Changes(superblock), row.szChanges);
        }
    });
    ExpectSteps(result, told);
}

TEST(SuperblockLine, Version)
{
    ExpectLines({
        {"        Version : 1.2\n", "major 1, minor 2, "},
        {"        Version : 0.90.00\n", "major 0, minor 90, "},
        {"        Version : 01.02.00\n", "major 1, minor 2, "},
        {"Version:1.10", "major 1, minor 10, "},
        {"Version : .3\n", "major 0, minor 3, "},
        {"Version : 4.\n", "major 4, minor 0, "},
        {"Version : .\n", "major 0, minor 0, "},
        {"Version : -1.-2\n", "major -1, minor -2, "},
        {"Version : 1x.2y\n", "major 1, minor 2, "},
    });
}

TEST(SuperblockLine, UuidLosesItsRemark)
{
    ExpectLines({
        {"     Array UUID : 1a:2b:3c:4d\n", "uuid 1a:2b:3c:4d, "},
        {"           UUID : 1a:2b:3c:4d\n", "uuid 1a:2b:3c:4d, "},
        {"           UUID : 1a:2b:3c:4d (local to host box)\n", "uuid 1a:2b:3c:4d, "},
        {"     Array UUID : 1a:2b:3c:4d (local to (host) box)\n", "uuid 1a:2b:3c:4d, "},
        {"UUID : ab(c)\n", "uuid a, "}, // whatever stands before the '(' goes
        {"UUID : ab  (c)\n", "uuid ab , "},
        {"UUID : a(b)\n", "uuid , "},
        {"UUID : (b)\n", "uuid , "},
        {"UUID : (\n", "uuid , "},
        {"UUID :\n", "uuid , "},
        {"UUID : \"1a:2b\"\n", "uuid 1a:2b, "},
    });
}

TEST(SuperblockLine, UuidIsCutToItsField)
{
    const std::string szLong(200, 'u');
    ExpectLines({
        {"UUID : " + szLong.substr(0, 63) + "\n", "uuid " + szLong.substr(0, 63) + ", "},
        {"UUID : " + szLong.substr(0, 64) + "\n", "uuid " + szLong.substr(0, 63) + ", "},
        {"UUID : " + szLong + "\n", "uuid " + szLong.substr(0, 63) + ", "},
    });
}

TEST(SuperblockLine, LevelWordsAreWholeWords)
{
    ExpectLines({
        {"     Raid Level : raid5\n", "level 4, "},
        {"     Raid Level : raid1\n", "level 2, "},
        {"     Raid Level : raid0\n", "level 1, "},
        {"     Raid Level : raid10\n", "level 16, "},
        {"     Raid Level : raid6\n", "level 8, "},
        {"     Raid Level : linear\n", "level 32, "},
        {"\t Raid Level\t:\traid6 \r\n", "level 8, "},
        {"Raid Level:\"raid0\"", "level 1, "},
    });
}

TEST(SuperblockLine, UnknownLevelCountsAsRaid5)
{
    ExpectLines({
        {"Raid Level : raid4\n", "level 4, "},
        {"Raid Level : container\n", "level 4, "},
        {"Raid Level : -unknown-\n", "level 4, "},
        {"Raid Level : raid100\n", "level 4, "},
        {"Raid Level : raid\n", "level 4, "},
        {"Raid Level : RAID1\n", "level 4, "},
        {"Raid Level : raid1 raid0\n", "level 4, "},
        {"Raid Level :\n", "level 4, "},
        {"Raid Level : raid1\v\n", "level 4, "}, // a vertical tab is not trimmed
    });
}

TEST(SuperblockLine, RaidDevices)
{
    ExpectLines({
        {"   Raid Devices : 4\n", "devices 4, "},
        {"   Raid Devices : 12 (was 4)\n", "devices 12, "},
        {"   Raid Devices : none\n", "devices 0, "},
        {"   Raid Devices :\n", "devices 0, "},
        {"   Raid Devices : -3\n", "devices -3, "},
        {"   Raid Devices : 99999999999\n", "devices 2147483647, "},
    });
}

TEST(SuperblockLine, NameAndPreferredMinorGiveTheMdPath)
{
    ExpectLines({
        {"           Name : box:12\n", "/dev/md12, "},
        {"           Name : 12\n", "/dev/md12, "},
        {"           Name : box:2  (local to host box)\n", "/dev/md2, "},
        {"           Name : a:b:7\n", "/dev/md7, "},
        {"           Name : a:b  (local to host a:9)\n", "/dev/md9, "},
        {"           Name : box:data\n", "/dev/md0, "},
        {"           Name : 5:\n", "/dev/md0, "},
        {"           Name :\n", "/dev/md0, "},
        {"           Name : box:-1\n", "/dev/md-1, "},
        {"Preferred Minor : 2\n", "/dev/md2, "},
        {"Preferred Minor : 127\n", "/dev/md127, "},
        {"Preferred Minor : x:3\n", "/dev/md3, "},
    });
}

TEST(SuperblockLine, DeviceRole)
{
    ExpectLines({
        {"   Device Role : Active device 3\n", "role 3, "},
        {"   Device Role : Active device 0\n", "role 0, "},
        {"   Device Role : Active device 12 of 20\n", "role 12, "},
        {"   Device Role : Active device x\n", "role 0, "},
        {"   Device Role : spare\n", "role -1, "},
        {"   Device Role : spare, rebuilding\n", "role -1, "},
        {"   Device Role : sparetime\n", "role -1, "},
    });
}

TEST(SuperblockLine, Events)
{
    ExpectLines({
        {"         Events : 17\n", "events 17, "},
        {"         Events : 0.42\n", "events 0, "},
        {"         Events : 17abc\n", "events 17, "},
        {"         Events :\n", "events 0, "},
    });
}

TEST(SuperblockLine, TheRowThatBeginsWithThis)
{
    ExpectLines({
        {"this     1       8       19        1      active sync   /dev/sdb3\n", "role 1, "},
        {"this\t-1 8 19\n", "role -1, "},
        {"this7\n", "role 7, "},
        {"this\n", "role 0, "},
        {"this", "role 0, "},
        {"thistle 5\n", "role 0, "},
        {"this \"6\"\n", "role 6, "},
    });
}

TEST(SuperblockLine, EverythingElseIsIgnored)
{
    ExpectLines({
        {""},
        {"\n"},
        {":\n"},
        {" : 5\n"},
        {"/dev/sda3:\n"},
        {"    Device UUID : 1:2:3:4\n"},
        {"Set UUID : 1:2:3:4\n"},
        {"uuid : 1:2:3:4\n"},
        {"Array  UUID : 1:2:3:4\n"},
        {"Array UUID\v: 1:2:3:4\n"},
        {"version : 9.9\n"},
        {"Versions : nine\n"},
        {"RAID Devices : 3\n"},
        {"  Total Devices : 3\n"},
        {"Names : 3\n"},
        {"Device Roles : Journal\n"},
        {"Eventscount : 3\n"},
        {"Version 1.2\n"},
        {" this     1       8       19\n"},
        {"This     1       8       19\n"},
        {"this : 5\n"}, // a pair, and no key of that name
        {"this 5 : 6\n"},
        {"   0     0       8        3        0      active sync   /dev/sda3\n"},
    });
}

TEST(SuperblockLine, IsCutAtItsLastLineEnd)
{
    ExpectLines({
        {"UUID : a\nb\n", "uuid a\nb, "},
        {"UUID : a\nb", "uuid a, "},
    });
}

STEPS Told(const std::string &szText)
{
    return {{"<11>raid_superblock.cpp:# bad " + szText}};
}

TEST(SuperblockLine, MalformedOnesFailWithTheirWords)
{
    ExpectLines({
        {"Version : 1\n", "", Told("version format: '1'.")},
        {"Version : one point two\n", "", Told("version format: 'one point two'.")},
        {"Version :\n", "", Told("version format: ''.")},
        {"Version : Intel, 2: 3\n", "", Told("version format: 'Intel, 2: 3'.")},
        {"   Device Role : Journal\n", "", Told("device order format: 'Journal'.")},
        {"   Device Role : Replacement device 0\n", "",
         Told("device order format: 'Replacement device 0'.")},
        {"   Device Role : active device 1\n", "", Told("device order format: 'active device 1'.")},
        {"   Device Role : Active device\n", "", Told("device order format: 'Active device'.")},
        {"   Device Role : Active device \n", "", Told("device order format: 'Active device'.")},
        {"   Device Role : Active  device 1\n", "",
         Told("device order format: 'Active  device 1'.")},
        {"   Device Role : Spare\n", "", Told("device order format: 'Spare'.")},
        {"   Device Role : a spare\n", "", Told("device order format: 'a spare'.")},
        {"   Device Role :\n", "", Told("device order format: ''.")},
    });
}

// ---- whole reports of real superblocks ---------------------------------------------------------

std::string ReportRead(const std::string &szName)
{
    std::ifstream in(std::string(EXAMINE_REPORTS) + "/" + szName, std::ios::binary);
    EXPECT_TRUE(in.is_open()) << szName;
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

struct REPORT_CASE {
    const char *szName;
    RAID_SUPERBLOCK superblock;
};

constexpr REPORT_CASE REPORT_CASES[] = {
    {"mirror-0.90", {0, 90, "5b1f2c3d:4e5f6071:8293a4b5:00000002", "/dev/md2", 2, 2, 1, 1}},
    {"mirror-1.0", {1, 0, "5b1f2c3d:4e5f6071:8293a4b5:00000002", "/dev/md2", 2, 2, 1, 0}},
    {"mirror-1.1", {1, 1, "5b1f2c3d:4e5f6071:8293a4b5:00000002", "/dev/md2", 2, 2, 1, 0}},
    {"mirror-1.2", {1, 2, "5b1f2c3d:4e5f6071:8293a4b5:00000002", "/dev/md2", 2, 2, 1, 0}},
    // The old format numbers a spare too; only the new one says that it has no slot.
    {"spare-0.90", {0, 90, "5b1f2c3d:4e5f6071:8293a4b5:00000003", "/dev/md3", 2, 2, 2, 1}},
    {"spare-1.0", {1, 0, "5b1f2c3d:4e5f6071:8293a4b5:00000003", "/dev/md3", 2, 2, -1, 0}},
    {"spare-1.1", {1, 1, "5b1f2c3d:4e5f6071:8293a4b5:00000003", "/dev/md3", 2, 2, -1, 0}},
    {"spare-1.2", {1, 2, "5b1f2c3d:4e5f6071:8293a4b5:00000003", "/dev/md3", 2, 2, -1, 0}},
    {"level-raid0", {1, 2, "5b1f2c3d:4e5f6071:8293a4b5:00000004", "/dev/md4", 1, 2, 0, 0}},
    {"level-raid4", {1, 2, "5b1f2c3d:4e5f6071:8293a4b5:00000005", "/dev/md5", 4, 3, 0, 0}},
    {"level-raid5", {1, 2, "5b1f2c3d:4e5f6071:8293a4b5:00000006", "/dev/md6", 4, 3, 2, 0}},
    {"level-raid6", {1, 2, "5b1f2c3d:4e5f6071:8293a4b5:00000007", "/dev/md7", 8, 4, 3, 0}},
    {"level-raid10", {1, 2, "5b1f2c3d:4e5f6071:8293a4b5:00000008", "/dev/md8", 16, 4, 0, 0}},
    {"level-linear", {1, 2, "5b1f2c3d:4e5f6071:8293a4b5:00000009", "/dev/md9", 32, 2, 1, 0}},
    {"level-linear-0.90", {0, 90, "5b1f2c3d:4e5f6071:8293a4b5:00000009", "/dev/md9", 32, 2, 1, 1}},
    {"name-of-another-host",
     {1, 2, "5b1f2c3d:4e5f6071:8293a4b5:0000000c", "/dev/md12", 2, 2, 0, 0}},
    {"name-without-number", {1, 2, "5b1f2c3d:4e5f6071:8293a4b5:0000000d", "/dev/md0", 2, 2, 0, 0}},
    {"name-without-host", {1, 2, "5b1f2c3d:4e5f6071:8293a4b5:0000000e", "/dev/md14", 2, 2, 0, 0}},
    {"name-with-umlaut", {1, 2, "5b1f2c3d:4e5f6071:8293a4b5:0000000f", "/dev/md0", 2, 2, 0, 0}},
    {"name-with-two-colons",
     {1, 2, "5b1f2c3d:4e5f6071:8293a4b5:00000010", "/dev/md16", 2, 2, 0, 0}},
    {"preferred-minor-127",
     {0, 90, "5b1f2c3d:4e5f6071:8293a4b5:0000007f", "/dev/md127", 2, 2, 0, 1}},
    {"degraded-raid5", {1, 2, "5b1f2c3d:4e5f6071:8293a4b5:00000014", "/dev/md20", 4, 3, 2, 2}},
    {"degraded-raid5-0.90",
     {0, 90, "5b1f2c3d:4e5f6071:8293a4b5:00000015", "/dev/md21", 4, 3, 2, 3}},
    // Its superblock was not written any more: it takes itself for a member.
    {"failed-member", {1, 2, "5b1f2c3d:4e5f6071:8293a4b5:00000014", "/dev/md20", 4, 3, 1, 0}},
    {"bitmap-internal", {1, 2, "5b1f2c3d:4e5f6071:8293a4b5:00000018", "/dev/md24", 2, 2, 0, 0}},
    {"warning-on-standard-error",
     {1, 2, "5b1f2c3d:4e5f6071:8293a4b5:00000028", "/dev/md40", 2, 2, 0, 0}},
    // Reports all the same, of something that has no UUID, or none in this form.
    {"mbr-only", {}},
    {"gpt-only", {}},
    {"container-ddf", {1, 2, "", "", 0, 0, 0, 0}},
    {"container-imsm", {1, 0, "00000000:00000000:00000000:00000000", "", 0, 0, 0, 0}},
};

TEST(SuperblockReport, LineByLineNeedsNoDevice)
{
    for (const REPORT_CASE &row : REPORT_CASES) {
        const std::string szReport = ReportRead(std::string(row.szName) + ".txt");
        ASSERT_NE(szReport, "") << row.szName;
        RAID_SUPERBLOCK superblock = {};
        for (size_t iStart = 0; iStart < szReport.size();) {
            const size_t iEnd = szReport.find('\n', iStart) + 1;
            std::string szLine = szReport.substr(iStart, iEnd - iStart);
            EXPECT_EQ(RAIDSuperblockLineParse(szLine.data(), &superblock), 0) << row.szName;
            iStart = iEnd;
        }
        EXPECT_EQ(Changes(superblock, row.superblock), "") << row.szName;
    }
}

TEST(SuperblockReport, OfEveryKindIsReadFromTheCommand)
{
    MACHINE machine = MachineMake();
    for (const REPORT_CASE &row : REPORT_CASES) {
        MachineTool(machine, std::string("/sbin/mdadm -E /dev/") + row.szName,
                    {.szOut = ReportRead(std::string(row.szName) + ".txt")});
    }
    QuietCall(machine, [] {
        for (const REPORT_CASE &row : REPORT_CASES) {
            RAID_SUPERBLOCK superblock = {};
            EXPECT_EQ(RAIDSuperblockGet((std::string("/dev/") + row.szName).c_str(), &superblock),
                      1);
            EXPECT_EQ(Changes(superblock, row.superblock), "") << row.szName;
        }
    });
}

// ---- the command -------------------------------------------------------------------------------

constexpr char EXAMINE[] = "/sbin/mdadm -E /dev/sda3";

struct GET_CASE {
    const char *szName;
    TOOL_ANSWER answer = {};
    int result = 1;
    std::string szChanges = {};
    STEPS told = {};
};

// The record, and its stream is closed.
long long SuperblockGet(const std::string &szChanges)
{
    openlog(nullptr, LOG_NDELAY, LOG_USER); // so that the log takes no new descriptor
    const int nOpen = DescriptorsCount();
    RAID_SUPERBLOCK superblock = BEFORE;
    const int result = RAIDSuperblockGet("/dev/sda3", &superblock);
    EXPECT_EQ(Changes(superblock), szChanges);
    EXPECT_EQ(DescriptorsCount(), nOpen);
    return result;
}

long long SuperblockGetNone()
{
    return SuperblockGet("");
}

void ExpectReports(const std::vector<GET_CASE> &cases)
{
    for (const GET_CASE &row : cases) {
        (void)ExpectCall({.szName = row.szName,
                          .call = [&row] { return SuperblockGet(row.szChanges); },
                          .result = row.result,
                          .steps = STEPS{{EXAMINE, row.answer}} + row.told});
        EXPECT_EQ(OperationErrors(), "");
    }
}

TEST(SuperblockGet, OfAReplacementOrAJournalFails)
{
    ExpectReports({{"replacement",
                    {.szOut = ReportRead("role-replacement.txt")},
                    -1,
                    "major 1, minor 2, uuid 5b1f2c3d:4e5f6071:8293a4b5:00000016, /dev/md22, "
                    "level 2, devices 2, events 2, ",
                    Told("device order format: 'Replacement device 0'.")},
                   {"journal",
                    {.szOut = ReportRead("role-journal.txt")},
                    -1,
                    "major 1, minor 2, uuid 5b1f2c3d:4e5f6071:8293a4b5:00000017, /dev/md23, "
                    "level 4, devices 3, events 2, ",
                    Told("device order format: 'Journal'.")}});
}

TEST(SuperblockGet, BadArgumentsRunNothing)
{
    const RUN_RESULT result = MachineCall(MachineMake(), [] {
        RAID_SUPERBLOCK superblock = BEFORE;
        EXPECT_QUIET(RAIDSuperblockGet(nullptr, &superblock), -1);
        EXPECT_QUIET(RAIDSuperblockGet("/dev/sda3", nullptr), -1);
        EXPECT_EQ(Changes(superblock), "");
    });
    ExpectSteps(result, 2 * STEPS{{"<11>raid_superblock.cpp:# Bad parameters"}});
}

TEST(SuperblockGet, NothingPrintedIsNoSuperblock)
{
    ExpectReports({{"blank", {.szErr = ReportRead("no-superblock.err"), .status = 1}, 0},
                   {"no device", {.szErr = ReportRead("no-such-device.err"), .status = 1}, 0},
                   {"translated",
                    {.szErr = "mdadm: auf /dev/sda3 wurde kein md-Superblock gefunden: äöü\n"},
                    0},
                   {"silence", {}, 0},
                   {"killed", {.signal = SIGKILL}, 0}});
    // A report there is in the file that goes with the first one, and it is empty.
    EXPECT_EQ(ReportRead("no-superblock.txt"), "");
    (void)ExpectCall({.szName = "no mdadm",
                      .machine = WithTool(MachineMake(), "/sbin/mdadm", TOOL_KIND::MISSING),
                      .call = SuperblockGetNone});
}

TEST(SuperblockGet, AnyLineIsAReportHoweverTheCommandEnds)
{
    const std::string szReport = ReportOf(UUID_MD2);
    const char *const szRead = "uuid 5b1f2c3d:4e5f6071:8293a4b5:00000002, ";
    const TOOL_ANSWER warnings = {.szOut = szReport, .szErr = "UUID : wrong\nVersion : falsch\n"};
    ExpectReports({{"an empty line", {.szOut = "\n"}},
                   {"a letter", {.szOut = "x"}},
                   {"words", {.szOut = "mdadm: something went wrong\n"}},
                   {"status 1", {.szOut = szReport, .status = 1}, 1, szRead},
                   {"killed", {.szOut = szReport, .signal = SIGKILL}, 1, szRead},
                   {"no line end", {.szOut = "UUID : cut off"}, 1, "uuid cut off, "},
                   {"warnings", warnings, 1, szRead},
                   // The rest of a line that does not fit is a line of its own.
                   {"1023", {.szOut = std::string(1023, 'x') + "this 5\n"}, 1, "role 5, "},
                   {"1022", {.szOut = std::string(1022, 'x') + "this 5\n"}}});
}

TEST(SuperblockGet, ALaterKeyWins)
{
    ExpectReports({{"", {.szOut = "Name : box:1\nPreferred Minor : 2\n"}, 1, "/dev/md2, "},
                   {"", {.szOut = "Preferred Minor : 2\nName : box:1\n"}, 1, "/dev/md1, "},
                   {"", {.szOut = "UUID : a\nArray UUID : b\n"}, 1, "uuid b, "},
                   {"", {.szOut = "Array UUID : b\nUUID : a\n"}, 1, "uuid a, "},
                   {"", {.szOut = "Device Role : spare\nthis 4\n"}, 1, "role 4, "},
                   {"", {.szOut = "this 4\nDevice Role : spare\n"}, 1, "role -1, "}});
}

// More than a pipe holds: the command must not be left waiting for a reader.
TEST(SuperblockGet, AMalformedLineEndsTheReading)
{
    const std::string szLines = "Version : bad\n" + std::string(300000, '\n') + "Version : worse\n";
    ExpectReports({{"worse", {.szOut = szLines}, -1, "", Told("version format: 'bad'.")}});
}

// Three lines, and the end. An interruption is none: the line is read again.
TEST(SuperblockGet, AReportThatCannotBeReadToItsEndFails)
{
    const char *const szRead = "uuid 5b1f2c3d:4e5f6071:8293a4b5:00000002, ";
    const auto log = [](int nCall, int error, int result, const char *szChanges) {
        MACHINE machine =
            WithFault(MachineMake(), {.szFunction = "fgets", .nCall = nCall, .error = error});
        MachineTool(machine, EXAMINE, {.szOut = ReportOf(UUID_MD2)});
        return LogText(
            MachineCall(machine, [=] { EXPECT_QUIET(SuperblockGet(szChanges), result); }));
    };
    for (int nCall = 1; nCall <= 4; nCall++) {
        EXPECT_EQ(log(nCall, EINTR, 1, szRead), "");
        EXPECT_EQ(log(nCall, EIO, -1, nCall == 4 ? szRead : ""),
                  "<11>raid_superblock.cpp:# Fail to read the report of mdadm -E /dev/sda3\n");
    }
}

TEST(SuperblockGet, ACommandThatCannotBeStartedFails)
{
    const struct {
        const char *szFunction;
        u32 code;
    } cases[] = {
        {"pipe2", ERR_PIPE_FAILED}, {"fork", ERR_FORK_FAILED}, {"fdopen", ERR_OPEN_FAILED}};
    for (const auto &row : cases) {
        SCOPED_TRACE(row.szFunction);
        MACHINE machine = WithFault(MachineMake(), {.szFunction = row.szFunction, .error = EMFILE});
        machine.fMayLeaveChildren = true; // without a stream nobody waits for the command
        MachineTool(machine, EXAMINE, {.nTimes = ANY_TIMES});
        const RUN_RESULT result =
            MachineCall(machine, [&row] { EXPECT_FAILS(SuperblockGetNone(), -1, row.code); });
        EXPECT_EQ(LogText(result),
                  "<11>raid_superblock.cpp:# Fail to do [/sbin/mdadm -E /dev/sda3]\n");
    }
}

TEST(SuperblockGet, TheCommandHasOnlyItsOutput)
{
    const RUN_RESULT result =
        ExpectCall({.szName = "silence", .call = SuperblockGetNone, .steps = {{EXAMINE}}});
    ASSERT_EQ(result.events.size(), 1U);
    EXPECT_TRUE(result.events[0].fNullInput);
    EXPECT_FALSE(result.events[0].fNullOutput);
    EXPECT_TRUE(result.events[0].fNullError);
}

} // namespace
