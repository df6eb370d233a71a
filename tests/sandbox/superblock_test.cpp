// SPDX-License-Identifier: MIT
#include "nurostoragecore/raid_superblock.h"

#include "removal_machine.h"

#include <cerrno>
#include <csignal>
#include <cstring>
#include <fcntl.h>
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

RAID_SUPERBLOCK WithVersion(i32 majorVersion, i32 minorVersion)
{
    RAID_SUPERBLOCK after = BEFORE;
    after.majorVersion = majorVersion;
    after.minorVersion = minorVersion;
    return after;
}

RAID_SUPERBLOCK WithUuid(const std::string &szUuid)
{
    RAID_SUPERBLOCK after = BEFORE;
    (void)snprintf(after.szUuid, sizeof(after.szUuid), "%s", szUuid.c_str());
    return after;
}

RAID_SUPERBLOCK WithMdPath(const char *szMdPath)
{
    RAID_SUPERBLOCK after = BEFORE;
    (void)snprintf(after.szMdPath, sizeof(after.szMdPath), "%s", szMdPath);
    return after;
}

RAID_SUPERBLOCK WithLevel(u32 level)
{
    RAID_SUPERBLOCK after = BEFORE;
    after.level = level;
    return after;
}

RAID_SUPERBLOCK WithDevices(i32 nRaidDevices)
{
    RAID_SUPERBLOCK after = BEFORE;
    after.nRaidDevices = nRaidDevices;
    return after;
}

RAID_SUPERBLOCK WithRole(i32 deviceRole)
{
    RAID_SUPERBLOCK after = BEFORE;
    after.deviceRole = deviceRole;
    return after;
}

RAID_SUPERBLOCK WithEvents(i32 events)
{
    RAID_SUPERBLOCK after = BEFORE;
    after.events = events;
    return after;
}

void LinesAreTaken(const std::vector<LINE_CASE> &cases)
{
    const RUN_RESULT result = MachineCall(MachineMake(), [&cases] {
        for (const LINE_CASE &row : cases) {
            std::string szLine = row.szLine;
            RAID_SUPERBLOCK superblock = BEFORE;
            EXPECT_EQ(RAIDSuperblockLineParse(szLine.data(), &superblock), 0) << row.szLine;
            EXPECT_EQ(superblock, row.after) << row.szLine;
        }
    });
    EXPECT_EQ(LogText(result), "");
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
        MachineTool(machine, ExamineCommand(row.szName),
                    {.szOut = ReportRead(std::string(row.szName) + ".txt")});
    }
    const RUN_RESULT result = MachineCall(machine, [] {
        for (const REPORT_CASE &row : REPORT_CASES) {
            RAID_SUPERBLOCK superblock = {};
            EXPECT_EQ(RAIDSuperblockGet((std::string("/dev/") + row.szName).c_str(), &superblock),
                      1);
            EXPECT_EQ(superblock, row.superblock) << row.szName;
        }
    });
    EXPECT_EQ(LogText(result), "");
}

struct BAD_REPORT_CASE {
    const char *szName;
    const char *szLog;
};

constexpr BAD_REPORT_CASE BAD_REPORT_CASES[] = {
    {"role-replacement", "bad device order format: 'Replacement device 0'."},
    {"role-journal", "bad device order format: 'Journal'."},
};

TEST(SuperblockReport, OfAReplacementOrAJournalFails)
{
    for (const BAD_REPORT_CASE &row : BAD_REPORT_CASES) {
        MACHINE machine = MachineMake();
        MachineTool(machine, ExamineCommand("sdc3"),
                    {.szOut = ReportRead(std::string(row.szName) + ".txt")});
        const RUN_RESULT result = MachineCall(machine, [] {
            RAID_SUPERBLOCK superblock = {};
            RecordReset();
            EXPECT_EQ(RAIDSuperblockGet("/dev/sdc3", &superblock), -1);
            EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
        });
        EXPECT_EQ(LogText(result), std::string("<11>raid_superblock.cpp:# ") + row.szLog + "\n");
    }
}

// ---- the command -------------------------------------------------------------------------------

void ReportGives(const TOOL_ANSWER &answer, int expected, const RAID_SUPERBLOCK &before,
                 const RAID_SUPERBLOCK &after, const std::string &szLog = "")
{
    MACHINE machine = MachineMake();
    MachineTool(machine, ExamineCommand("sda3"), answer);
    const RUN_RESULT result = MachineCall(machine, [&] {
        RAID_SUPERBLOCK superblock = before;
        RecordReset();
        EXPECT_EQ(RAIDSuperblockGet("/dev/sda3", &superblock), expected);
        EXPECT_EQ(superblock, after);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
    EXPECT_EQ(TranscriptText(result), "/sbin/mdadm -E /dev/sda3\n");
    EXPECT_EQ(LogText(result), szLog);
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
    EXPECT_EQ(LogText(result), "<11>raid_superblock.cpp:# Bad parameters\n"
                               "<11>raid_superblock.cpp:# Bad parameters\n");
    EXPECT_EQ(TranscriptText(result), "");
}

TEST(SuperblockGet, NothingPrintedIsNoSuperblock)
{
    ReportGives({.szErr = ReportRead("no-superblock.err"), .status = 1}, 0, BEFORE, BEFORE);
    ReportGives({.szErr = ReportRead("no-such-device.err"), .status = 1}, 0, BEFORE, BEFORE);
    ReportGives({.szErr = "mdadm: auf /dev/sda3 wurde kein md-Superblock gefunden: äöü\n"}, 0,
                BEFORE, BEFORE);
    ReportGives({}, 0, BEFORE, BEFORE);
    ReportGives({.signal = SIGKILL}, 0, BEFORE, BEFORE);
    // A report there is in the file that goes with the first one, and it is empty.
    EXPECT_EQ(ReportRead("no-superblock.txt"), "");
}

TEST(SuperblockGet, AnyLineIsAReport)
{
    ReportGives({.szOut = "\n"}, 1, BEFORE, BEFORE);
    ReportGives({.szOut = "x"}, 1, BEFORE, BEFORE);
    ReportGives({.szOut = "mdadm: something went wrong\n"}, 1, BEFORE, BEFORE);
}

TEST(SuperblockGet, HowTheCommandEndsIsNotAsked)
{
    const std::string szReport = ReportOf(UUID_MD2);
    ReportGives({.szOut = szReport, .status = 1}, 1, BEFORE, WithUuid(UUID_MD2));
    ReportGives({.szOut = szReport, .signal = SIGKILL}, 1, BEFORE, WithUuid(UUID_MD2));
    ReportGives({.szOut = "UUID : cut off"}, 1, BEFORE, WithUuid("cut off"));
}

TEST(SuperblockGet, WarningsAreNoPartOfTheReport)
{
    ReportGives({.szOut = ReportOf(UUID_MD2), .szErr = "UUID : wrong\nVersion : falsch\n"}, 1,
                BEFORE, WithUuid(UUID_MD2));
    EXPECT_EQ(MachineFileRead("/var/log/space_operation_error.log"), std::nullopt);
}

TEST(SuperblockGet, ALaterKeyWins)
{
    ReportGives({.szOut = "Name : box:1\nPreferred Minor : 2\n"}, 1, BEFORE,
                WithMdPath("/dev/md2"));
    ReportGives({.szOut = "Preferred Minor : 2\nName : box:1\n"}, 1, BEFORE,
                WithMdPath("/dev/md1"));
    ReportGives({.szOut = "UUID : a\nArray UUID : b\n"}, 1, BEFORE, WithUuid("b"));
    ReportGives({.szOut = "Array UUID : b\nUUID : a\n"}, 1, BEFORE, WithUuid("a"));
    ReportGives({.szOut = "Device Role : spare\nthis 4\n"}, 1, BEFORE, WithRole(4));
    ReportGives({.szOut = "this 4\nDevice Role : spare\n"}, 1, BEFORE, WithRole(-1));
}

// The rest of a line that does not fit is a line of its own.
TEST(SuperblockGet, LongLinesComeInPieces)
{
    ReportGives({.szOut = std::string(1023, 'x') + "this 5\n"}, 1, BEFORE, WithRole(5));
    ReportGives({.szOut = std::string(1022, 'x') + "this 5\n"}, 1, BEFORE, BEFORE);
}

TEST(SuperblockGet, AMalformedLineEndsTheReading)
{
    MACHINE machine = MachineMake();
    // More than a pipe holds: the command must not be left waiting for a reader.
    MachineTool(machine, ExamineCommand("sda3"),
                {.szOut = "Version : bad\n" + std::string(300000, '\n') + "Version : worse\n"});
    const RUN_RESULT result = MachineCall(machine, [] {
        openlog(nullptr, LOG_NDELAY, LOG_USER); // so that the log takes no new descriptor
        const int fdBefore = dup(STDIN_FILENO);
        RAID_SUPERBLOCK superblock = {};
        EXPECT_EQ(RAIDSuperblockGet("/dev/sda3", &superblock), -1);
        const int fdAfter = dup(STDIN_FILENO);
        EXPECT_EQ(fdAfter, fdBefore + 1); // the stream is closed
    });
    EXPECT_EQ(LogText(result), "<11>raid_superblock.cpp:# bad version format: 'bad'.\n");
}

TEST(SuperblockGet, AReportThatCannotBeReadToItsEndFails)
{
    for (int nCall = 1; nCall <= 4; nCall++) { // three lines, and the end
        MACHINE machine = MachineMake();
        MachineTool(machine, ExamineCommand("sda3"), {.szOut = ReportOf(UUID_MD2)});
        machine.faults = {{.szFunction = "fgets", .nCall = nCall, .error = EIO}};
        const RUN_RESULT result = MachineCall(machine, [] {
            NLIBCErrSet(ERR_OUT_OF_SPACE, "before", 1);
            RAID_SUPERBLOCK superblock = {};
            EXPECT_EQ(RAIDSuperblockGet("/dev/sda3", &superblock), -1);
            EXPECT_EQ(NLIBCErrGet(), ERR_OUT_OF_SPACE);
        });
        EXPECT_EQ(LogText(result),
                  "<11>raid_superblock.cpp:# Fail to read the report of mdadm -E /dev/sda3\n");
    }
    // An interruption is none: the line is read again.
    MACHINE machine = MachineMake();
    MachineTool(machine, ExamineCommand("sda3"), {.szOut = ReportOf(UUID_MD2)});
    machine.faults = {{.szFunction = "fgets", .nCall = 2, .error = EINTR}};
    (void)MachineCall(machine, [] {
        RAID_SUPERBLOCK superblock = {};
        EXPECT_EQ(RAIDSuperblockGet("/dev/sda3", &superblock), 1);
        EXPECT_STREQ(superblock.szUuid, UUID_MD2);
    });
}

TEST(SuperblockGet, AMissingCommandIsNoSuperblock)
{
    MACHINE machine = MachineMake();
    machine.tools["/sbin/mdadm"] = TOOL_KIND::MISSING;
    const RUN_RESULT result = MachineCall(machine, [] {
        RAID_SUPERBLOCK superblock = BEFORE;
        EXPECT_EQ(RAIDSuperblockGet("/dev/sda3", &superblock), 0);
        EXPECT_EQ(superblock, BEFORE);
    });
    EXPECT_EQ(LogText(result), "");
}

struct START_CASE {
    const char *szFunction;
    u32 code;
};

constexpr START_CASE START_CASES[] = {
    {"pipe2", ERR_PIPE_FAILED},
    {"fork", ERR_FORK_FAILED},
    {"fdopen", ERR_OPEN_FAILED},
};

TEST(SuperblockGet, ACommandThatCannotBeStartedFails)
{
    for (const START_CASE &row : START_CASES) {
        MACHINE machine = MachineMake();
        machine.faults = {{.szFunction = row.szFunction, .error = EMFILE}};
        machine.fMayLeaveChildren = true; // without a stream nobody waits for the command
        MachineTool(machine, ExamineCommand("sda3"), {.nTimes = ANY_TIMES});
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
    MACHINE machine = MachineMake();
    MachineTool(machine, ExamineCommand("sda3"));
    const RUN_RESULT result = MachineCall(machine, [] {
        RAID_SUPERBLOCK superblock = {};
        EXPECT_EQ(RAIDSuperblockGet("/dev/sda3", &superblock), 0);
    });
    ASSERT_EQ(result.events.size(), 1U);
    EXPECT_TRUE(result.events[0].fNullInput);
    EXPECT_FALSE(result.events[0].fNullOutput);
    EXPECT_TRUE(result.events[0].fNullError);
    EXPECT_EQ(result.events[0].nDescriptors, 0);
}

} // namespace
