// SPDX-License-Identifier: MIT
#include "nurostoragecore/raid_superblock.h"

#include "removal_machine.h"

#include <cerrno>
#include <csignal>
#include <cstring>
#include <fstream>
#include <gtest/gtest.h>
#include <iterator>
#include <ostream>
#include <string>
#include <string_view>
#include <syslog.h>
#include <unistd.h>

// Not in the unnamed namespace: the comparing macros look only beside the type.
static bool operator==(const RAID_SUPERBLOCK &a, const RAID_SUPERBLOCK &b)
{
    return a.majorVersion == b.majorVersion && a.minorVersion == b.minorVersion &&
           strcmp(a.szUuid, b.szUuid) == 0 && strcmp(a.szMdPath, b.szMdPath) == 0 &&
           a.level == b.level && a.nRaidDevices == b.nRaidDevices && a.deviceRole == b.deviceRole &&
           a.events == b.events;
}

static std::ostream &operator<<(std::ostream &out, const RAID_SUPERBLOCK &superblock)
{
    return out << superblock.majorVersion << '.' << superblock.minorVersion << " '"
               << superblock.szUuid << "' '" << superblock.szMdPath << "' level "
               << superblock.level << ", " << superblock.nRaidDevices << " devices, role "
               << superblock.deviceRole << ", events " << superblock.events;
}

namespace
{

// ---- one line ----------------------------------------------------------------------------------

// What a line does not say must stay as it was.
constexpr RAID_SUPERBLOCK BEFORE = {71, 72, "old uuid", "old path", 73, 74, 75, 76};

struct LINE_CASE {
    std::string szLine;
    RAID_SUPERBLOCK after;
};

// As before, but for one thing.
RAID_SUPERBLOCK After(const std::function<void(RAID_SUPERBLOCK &)> &change)
{
    RAID_SUPERBLOCK after = BEFORE;
    change(after);
    return after;
}

RAID_SUPERBLOCK WithVersion(i32 majorVersion, i32 minorVersion)
{
    return After([=](RAID_SUPERBLOCK &after) {
        after.majorVersion = majorVersion;
        after.minorVersion = minorVersion;
    });
}

RAID_SUPERBLOCK WithUuid(const std::string &szUuid)
{
    return After([&](RAID_SUPERBLOCK &after) {
        (void)snprintf(after.szUuid, sizeof(after.szUuid), "%s", szUuid.c_str());
    });
}

RAID_SUPERBLOCK WithMdPath(const char *szMdPath)
{
    return After([=](RAID_SUPERBLOCK &after) {
        (void)snprintf(after.szMdPath, sizeof(after.szMdPath), "%s", szMdPath);
    });
}

RAID_SUPERBLOCK WithLevel(u32 level)
{
    return After([=](RAID_SUPERBLOCK &after) { after.level = level; });
}

RAID_SUPERBLOCK WithDevices(i32 nRaidDevices)
{
    return After([=](RAID_SUPERBLOCK &after) { after.nRaidDevices = nRaidDevices; });
}

RAID_SUPERBLOCK WithRole(i32 deviceRole)
{
    return After([=](RAID_SUPERBLOCK &after) { after.deviceRole = deviceRole; });
}

RAID_SUPERBLOCK WithEvents(i32 events)
{
    return After([=](RAID_SUPERBLOCK &after) { after.events = events; });
}

void LinesAreTaken(const std::vector<LINE_CASE> &cases)
{
    QuietCall(MachineMake(), [&cases] {
        for (const LINE_CASE &row : cases) {
            std::string szLine = row.szLine;
            RAID_SUPERBLOCK superblock = BEFORE;
            EXPECT_EQ(RAIDSuperblockLineParse(szLine.data(), &superblock), 0) << row.szLine;
            EXPECT_EQ(superblock, row.after) << row.szLine;
        }
    });
}

TEST(SuperblockLine, Version)
{
    LinesAreTaken({
        {"        Version : 1.2\n", WithVersion(1, 2)},
        {"        Version : 0.90.00\n", WithVersion(0, 90)},
        {"        Version : 01.02.00\n", WithVersion(1, 2)},
        {"Version:1.10", WithVersion(1, 10)},
        {"Version : .3\n", WithVersion(0, 3)},
        {"Version : 4.\n", WithVersion(4, 0)},
        {"Version : .\n", WithVersion(0, 0)},
        {"Version : -1.-2\n", WithVersion(-1, -2)},
        {"Version : 1x.2y\n", WithVersion(1, 2)},
    });
}

TEST(SuperblockLine, UuidLosesItsRemark)
{
    LinesAreTaken({
        {"     Array UUID : 1a:2b:3c:4d\n", WithUuid("1a:2b:3c:4d")},
        {"           UUID : 1a:2b:3c:4d\n", WithUuid("1a:2b:3c:4d")},
        {"           UUID : 1a:2b:3c:4d (local to host box)\n", WithUuid("1a:2b:3c:4d")},
        {"     Array UUID : 1a:2b:3c:4d (local to (host) box)\n", WithUuid("1a:2b:3c:4d")},
        {"UUID : ab(c)\n", WithUuid("a")}, // whatever stands before the '(' goes
        {"UUID : ab  (c)\n", WithUuid("ab ")},
        {"UUID : a(b)\n", WithUuid("")},
        {"UUID : (b)\n", WithUuid("")},
        {"UUID : (\n", WithUuid("")},
        {"UUID :\n", WithUuid("")},
        {"UUID : \"1a:2b\"\n", WithUuid("1a:2b")},
    });
}

TEST(SuperblockLine, UuidIsCutToItsField)
{
    const std::string szLong(200, 'u');
    LinesAreTaken({
        {"UUID : " + szLong.substr(0, 63) + "\n", WithUuid(szLong.substr(0, 63))},
        {"UUID : " + szLong.substr(0, 64) + "\n", WithUuid(szLong.substr(0, 63))},
        {"UUID : " + szLong + "\n", WithUuid(szLong.substr(0, 63))},
    });
}

TEST(SuperblockLine, LevelWordsAreWholeWords)
{
    LinesAreTaken({
        {"     Raid Level : raid5\n", WithLevel(4)},
        {"     Raid Level : raid1\n", WithLevel(2)},
        {"     Raid Level : raid0\n", WithLevel(1)},
        {"     Raid Level : raid10\n", WithLevel(16)},
        {"     Raid Level : raid6\n", WithLevel(8)},
        {"     Raid Level : linear\n", WithLevel(32)},
        {"\t Raid Level\t:\traid6 \r\n", WithLevel(8)},
        {"Raid Level:\"raid0\"", WithLevel(1)},
    });
}

TEST(SuperblockLine, UnknownLevelCountsAsRaid5)
{
    LinesAreTaken({
        {"Raid Level : raid4\n", WithLevel(4)},
        {"Raid Level : container\n", WithLevel(4)},
        {"Raid Level : -unknown-\n", WithLevel(4)},
        {"Raid Level : raid100\n", WithLevel(4)},
        {"Raid Level : raid\n", WithLevel(4)},
        {"Raid Level : RAID1\n", WithLevel(4)},
        {"Raid Level : raid1 raid0\n", WithLevel(4)},
        {"Raid Level :\n", WithLevel(4)},
        {"Raid Level : raid1\v\n", WithLevel(4)}, // a vertical tab is not trimmed
    });
}

TEST(SuperblockLine, RaidDevices)
{
    LinesAreTaken({
        {"   Raid Devices : 4\n", WithDevices(4)},
        {"   Raid Devices : 12 (was 4)\n", WithDevices(12)},
        {"   Raid Devices : none\n", WithDevices(0)},
        {"   Raid Devices :\n", WithDevices(0)},
        {"   Raid Devices : -3\n", WithDevices(-3)},
        {"   Raid Devices : 99999999999\n", WithDevices(2147483647)},
    });
}

TEST(SuperblockLine, NameAndPreferredMinorGiveTheMdPath)
{
    LinesAreTaken({
        {"           Name : box:12\n", WithMdPath("/dev/md12")},
        {"           Name : 12\n", WithMdPath("/dev/md12")},
        {"           Name : box:2  (local to host box)\n", WithMdPath("/dev/md2")},
        {"           Name : a:b:7\n", WithMdPath("/dev/md7")},
        {"           Name : a:b  (local to host a:9)\n", WithMdPath("/dev/md9")},
        {"           Name : box:data\n", WithMdPath("/dev/md0")},
        {"           Name : 5:\n", WithMdPath("/dev/md0")},
        {"           Name :\n", WithMdPath("/dev/md0")},
        {"           Name : box:-1\n", WithMdPath("/dev/md-1")},
        {"Preferred Minor : 2\n", WithMdPath("/dev/md2")},
        {"Preferred Minor : 127\n", WithMdPath("/dev/md127")},
        {"Preferred Minor : x:3\n", WithMdPath("/dev/md3")},
    });
}

TEST(SuperblockLine, DeviceRole)
{
    LinesAreTaken({
        {"   Device Role : Active device 3\n", WithRole(3)},
        {"   Device Role : Active device 0\n", WithRole(0)},
        {"   Device Role : Active device 12 of 20\n", WithRole(12)},
        {"   Device Role : Active device x\n", WithRole(0)},
        {"   Device Role : spare\n", WithRole(-1)},
        {"   Device Role : spare, rebuilding\n", WithRole(-1)},
        {"   Device Role : sparetime\n", WithRole(-1)},
    });
}

TEST(SuperblockLine, Events)
{
    LinesAreTaken({
        {"         Events : 17\n", WithEvents(17)},
        {"         Events : 0.42\n", WithEvents(0)},
        {"         Events : 17abc\n", WithEvents(17)},
        {"         Events :\n", WithEvents(0)},
    });
}

TEST(SuperblockLine, TheRowThatBeginsWithThis)
{
    LinesAreTaken({
        {"this     1       8       19        1      active sync   /dev/sdb3\n", WithRole(1)},
        {"this\t-1 8 19\n", WithRole(-1)},
        {"this7\n", WithRole(7)},
        {"this\n", WithRole(0)},
        {"this", WithRole(0)},
        {"thistle 5\n", WithRole(0)},
        {"this \"6\"\n", WithRole(6)},
    });
}

TEST(SuperblockLine, EverythingElseIsIgnored)
{
    LinesAreTaken({
        {"", BEFORE},
        {"\n", BEFORE},
        {":\n", BEFORE},
        {" : 5\n", BEFORE},
        {"/dev/sda3:\n", BEFORE},
        {"    Device UUID : 1:2:3:4\n", BEFORE},
        {"Set UUID : 1:2:3:4\n", BEFORE},
        {"uuid : 1:2:3:4\n", BEFORE},
        {"Array  UUID : 1:2:3:4\n", BEFORE},
        {"Array UUID\v: 1:2:3:4\n", BEFORE},
        {"version : 9.9\n", BEFORE},
        {"Versions : nine\n", BEFORE},
        {"RAID Devices : 3\n", BEFORE},
        {"  Total Devices : 3\n", BEFORE},
        {"Names : 3\n", BEFORE},
        {"Device Roles : Journal\n", BEFORE},
        {"Eventscount : 3\n", BEFORE},
        {"Version 1.2\n", BEFORE},
        {" this     1       8       19\n", BEFORE},
        {"This     1       8       19\n", BEFORE},
        {"this : 5\n", BEFORE}, // a pair, and no key of that name
        {"this 5 : 6\n", BEFORE},
        {"   0     0       8        3        0      active sync   /dev/sda3\n", BEFORE},
    });
}

TEST(SuperblockLine, IsCutAtItsLastLineEnd)
{
    LinesAreTaken({
        {"UUID : a\nb\n", WithUuid("a\nb")},
        {"UUID : a\nb", WithUuid("a")},
    });
}

struct MALFORMED_CASE {
    const char *szLine;
    const char *szLog;
};

constexpr MALFORMED_CASE MALFORMED_CASES[] = {
    {"Version : 1\n", "bad version format: '1'."},
    {"Version : one point two\n", "bad version format: 'one point two'."},
    {"Version :\n", "bad version format: ''."},
    {"Version : Intel, 2: 3\n", "bad version format: 'Intel, 2: 3'."},
    {"   Device Role : Journal\n", "bad device order format: 'Journal'."},
    {"   Device Role : Replacement device 0\n", "bad device order format: 'Replacement device 0'."},
    {"   Device Role : active device 1\n", "bad device order format: 'active device 1'."},
    {"   Device Role : Active device\n", "bad device order format: 'Active device'."},
    {"   Device Role : Active device \n", "bad device order format: 'Active device'."},
    {"   Device Role : Active  device 1\n", "bad device order format: 'Active  device 1'."},
    {"   Device Role : Spare\n", "bad device order format: 'Spare'."},
    {"   Device Role : a spare\n", "bad device order format: 'a spare'."},
    {"   Device Role :\n", "bad device order format: ''."},
};

TEST(SuperblockLine, MalformedOnesFailWithTheirWords)
{
    for (const MALFORMED_CASE &row : MALFORMED_CASES) {
        const RUN_RESULT result = MachineCall(MachineMake(), [&row] {
            std::string szLine = row.szLine;
            RAID_SUPERBLOCK superblock = BEFORE;
            RecordReset();
            EXPECT_EQ(RAIDSuperblockLineParse(szLine.data(), &superblock), -1) << row.szLine;
            EXPECT_EQ(NLIBCErrGet(), OLD_CODE) << row.szLine;
        });
        EXPECT_EQ(LogText(result), std::string("<11>raid_superblock.cpp:# ") + row.szLog + "\n");
    }
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
        EXPECT_EQ(superblock, row.superblock) << row.szName;
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
            EXPECT_EQ(superblock, row.superblock) << row.szName;
        }
    });
}

// ---- the command -------------------------------------------------------------------------------

constexpr char EXAMINE[] = "/sbin/mdadm -E /dev/sda3";

struct GET_CASE {
    const char *szName;
    TOOL_ANSWER answer = {};
    int result = 1;
    RAID_SUPERBLOCK after = BEFORE;
    STEPS told = {};
    MACHINE machine = MachineMake();
    u32 code = OLD_CODE;
};

// The record, and its stream is closed.
long long SuperblockGet(const RAID_SUPERBLOCK &after)
{
    openlog(nullptr, LOG_NDELAY, LOG_USER); // so that the log takes no new descriptor
    const int fdBefore = dup(STDIN_FILENO);
    RAID_SUPERBLOCK superblock = BEFORE;
    const int result = RAIDSuperblockGet("/dev/sda3", &superblock);
    EXPECT_EQ(superblock, after);
    EXPECT_EQ(dup(STDIN_FILENO), fdBefore + 1);
    return result;
}

void ExpectReports(const std::vector<GET_CASE> &cases)
{
    for (const GET_CASE &row : cases) {
        (void)ExpectCall({.szName = row.szName,
                          .machine = row.machine,
                          .call = [&row] { return SuperblockGet(row.after); },
                          .result = row.result,
                          .code = row.code,
                          .steps = STEPS{{EXAMINE, row.answer}} + row.told});
        EXPECT_EQ(OperationErrors(), "");
    }
}

TEST(SuperblockGet, OfAReplacementOrAJournalFails)
{
    ExpectReports(
        {{"replacement",
          {.szOut = ReportRead("role-replacement.txt")},
          -1,
          {1, 2, "5b1f2c3d:4e5f6071:8293a4b5:00000016", "/dev/md22", 2, 2, 75, 2},
          {{"<11>raid_superblock.cpp:# bad device order format: 'Replacement device 0'."}}},
         {"journal",
          {.szOut = ReportRead("role-journal.txt")},
          -1,
          {1, 2, "5b1f2c3d:4e5f6071:8293a4b5:00000017", "/dev/md23", 4, 3, 75, 2},
          {{"<11>raid_superblock.cpp:# bad device order format: 'Journal'."}}}});
}

TEST(SuperblockGet, BadArgumentsRunNothing)
{
    const RUN_RESULT result = MachineCall(MachineMake(), [] {
        RAID_SUPERBLOCK superblock = BEFORE;
        RecordReset();
        EXPECT_EQ(RAIDSuperblockGet(nullptr, &superblock), -1);
        EXPECT_EQ(RAIDSuperblockGet("/dev/sda3", nullptr), -1);
        EXPECT_EQ(superblock, BEFORE);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
    EXPECT_EQ(OrderText(result), "<11>raid_superblock.cpp:# Bad parameters\n"
                                 "<11>raid_superblock.cpp:# Bad parameters\n");
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
}

TEST(SuperblockGet, AnyLineIsAReportHoweverTheCommandEnds)
{
    const std::string szReport = ReportOf(UUID_MD2);
    ExpectReports({{"an empty line", {.szOut = "\n"}},
                   {"a letter", {.szOut = "x"}},
                   {"words", {.szOut = "mdadm: something went wrong\n"}},
                   {"status 1", {.szOut = szReport, .status = 1}, 1, WithUuid(UUID_MD2)},
                   {"killed", {.szOut = szReport, .signal = SIGKILL}, 1, WithUuid(UUID_MD2)},
                   {"no line end", {.szOut = "UUID : cut off"}, 1, WithUuid("cut off")},
                   {"warnings",
                    {.szOut = szReport, .szErr = "UUID : wrong\nVersion : falsch\n"},
                    1,
                    WithUuid(UUID_MD2)},
                   // The rest of a line that does not fit is a line of its own.
                   {"1023", {.szOut = std::string(1023, 'x') + "this 5\n"}, 1, WithRole(5)},
                   {"1022", {.szOut = std::string(1022, 'x') + "this 5\n"}}});
}

TEST(SuperblockGet, ALaterKeyWins)
{
    ExpectReports(
        {{"minor", {.szOut = "Name : box:1\nPreferred Minor : 2\n"}, 1, WithMdPath("/dev/md2")},
         {"name", {.szOut = "Preferred Minor : 2\nName : box:1\n"}, 1, WithMdPath("/dev/md1")},
         {"array", {.szOut = "UUID : a\nArray UUID : b\n"}, 1, WithUuid("b")},
         {"UUID", {.szOut = "Array UUID : b\nUUID : a\n"}, 1, WithUuid("a")},
         {"this", {.szOut = "Device Role : spare\nthis 4\n"}, 1, WithRole(4)},
         {"role", {.szOut = "this 4\nDevice Role : spare\n"}, 1, WithRole(-1)}});
}

// More than a pipe holds: the command must not be left waiting for a reader.
TEST(SuperblockGet, AMalformedLineEndsTheReading)
{
    ExpectReports({{"bad, worse",
                    {.szOut = "Version : bad\n" + std::string(300000, '\n') + "Version : worse\n"},
                    -1,
                    BEFORE,
                    {{"<11>raid_superblock.cpp:# bad version format: 'bad'."}}}});
}

// Three lines, and the end. An interruption is none: the line is read again.
TEST(SuperblockGet, AReportThatCannotBeReadToItsEndFails)
{
    for (int nCall = 1; nCall <= 4; nCall++) {
        for (const int error : {EIO, EINTR}) {
            const bool fRead = error == EINTR;
            SCOPED_TRACE(testing::Message() << nCall << ' ' << error);
            MACHINE machine =
                WithFault(MachineMake(), {.szFunction = "fgets", .nCall = nCall, .error = error});
            MachineTool(machine, EXAMINE, {.szOut = ReportOf(UUID_MD2)});
            const RUN_RESULT result = MachineCall(machine, [&] {
                RAID_SUPERBLOCK superblock = {};
                RecordReset();
                EXPECT_EQ(RAIDSuperblockGet("/dev/sda3", &superblock), fRead ? 1 : -1);
                EXPECT_STREQ(superblock.szUuid, fRead || nCall == 4 ? UUID_MD2 : "");
                EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
            });
            EXPECT_EQ(LogText(result), fRead ? ""
                                             : "<11>raid_superblock.cpp:# Fail to read the report "
                                               "of mdadm -E /dev/sda3\n");
        }
    }
}

TEST(SuperblockGet, AMissingCommandIsNoSuperblock)
{
    (void)ExpectCall({.szName = "no mdadm",
                      .machine = WithTool(MachineMake(), "/sbin/mdadm", TOOL_KIND::MISSING),
                      .call = [] { return SuperblockGet(BEFORE); }});
}

TEST(SuperblockGet, ACommandThatCannotBeStartedFails)
{
    const struct {
        const char *szFunction;
        u32 code;
    } cases[] = {
        {"pipe2", ERR_PIPE_FAILED}, {"fork", ERR_FORK_FAILED}, {"fdopen", ERR_OPEN_FAILED}};
    for (const auto &row : cases) {
        MACHINE machine = WithFault(MachineMake(), {.szFunction = row.szFunction, .error = EMFILE});
        machine.fMayLeaveChildren = true; // without a stream nobody waits for the command
        MachineTool(machine, EXAMINE, {.nTimes = ANY_TIMES});
        const RUN_RESULT result = MachineCall(machine, [&row] {
            RAID_SUPERBLOCK superblock = BEFORE;
            EXPECT_EQ(RAIDSuperblockGet("/dev/sda3", &superblock), -1) << row.szFunction;
            EXPECT_EQ(superblock, BEFORE);
            EXPECT_EQ(NLIBCErrGet(), row.code) << row.szFunction;
        });
        EXPECT_EQ(LogText(result),
                  "<11>raid_superblock.cpp:# Fail to do [/sbin/mdadm -E /dev/sda3]\n");
    }
}

TEST(SuperblockGet, TheCommandHasOnlyItsOutput)
{
    const RUN_RESULT result = ExpectCall(
        {.szName = "silence", .call = [] { return SuperblockGet(BEFORE); }, .steps = {{EXAMINE}}});
    ASSERT_EQ(result.events.size(), 1U);
    EXPECT_TRUE(result.events[0].fNullInput);
    EXPECT_FALSE(result.events[0].fNullOutput);
    EXPECT_TRUE(result.events[0].fNullError);
}

} // namespace
