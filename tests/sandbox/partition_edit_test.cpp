// SPDX-License-Identifier: MIT
#include "nurostoragecore/partition_edit.h"

#include "nurocore/error.h"
#include "nurostoragecore/partition_enum.h"
#include "nurostoragecore/partition_layout.h"
#include "nurostoragecore/partition_version.h"
#include "storage_machine.h"

#include <cerrno>
#include <climits>
#include <gtest/gtest.h>
#include <optional>
#include <string>
#include <vector>

namespace
{

constexpr u64 UNTOUCHED = 4711;
constexpr u64 ALL_ONES = 0xFFFFFFFFFFFFFFFFULL;
constexpr char ERROR_LOG[] = "/var/log/space_operation_error.log";

// With a call that has no code of its own.
RUN_RESULT ExpectCreate(const MACHINE &machine, int kind, std::optional<u32> version, int result,
                        const STEPS &steps)
{
    return ExpectCall({.szName = "create",
                       .machine = machine,
                       .call =
                           [=] {
                               const u32 wanted = version.value_or(0);
                               return PartitionCreate("/dev/sda", kind,
                                                      version ? &wanted : nullptr);
                           },
                       .result = result,
                       .steps = StepsOn("sda", steps)});
}

// ---- system and swap partitions ----------------------------------------------------------------

struct SYSTEM_CASE {
    std::string szConf;
    u32 version;
    STEPS made;
};

const SYSTEM_CASE SYSTEM_CASES[] = {
    {CONF_RAID, 8, MADE_8},
    {CONF_RAID, 0, MADE_8},
    {CONF_RAID, 7, MADE_7},
    {CONF_RAID, 6, MADE_6},
    {CONF_RAID, 2, MADE_2},
    {CONF_RAID, 1, MADE_1},
    {CONF_NO_RAID, 8, MADE_8_NO_RAID},
    {CONF_NO_RAID, 7, Made("-j256 -z4980480 -t83", "-j0 -z4194304 -t82")},
    {CONF_NO_RAID, 6, Made("-j63 -z4980087 -t83", "-j0 -z4192965 -t82")},
    {CONF_NO_RAID, 5, Made("-j63 -z722862 -t83", "-j0 -z594405 -t82")},
    {CONF_NO_RAID, 3, MADE_3_NO_RAID},
    {CONF_NO_RAID, 2, Made("-j63 -z4980087 -t83", "-j0 -z1044225 -t82")},
    {CONF_NO_RAID, 1, Made("-j63 -z273042 -t83", "-j0 -z787185 -t82")},
    // The row says 83 for partition 2; the model decides.
    {CONF_BUILDIN, 7, MADE_BUILDIN},
    {CONF_BUILDIN, 8, MADE_BUILDIN},
    {CONF_BUILDIN, 0, MADE_BUILDIN},
};

TEST(PartitionCreateSystem, WritesASignatureAndTheTwoPartitionsOfTheVersion)
{
    for (const SYSTEM_CASE &row : SYSTEM_CASES) {
        SCOPED_TRACE(row.szConf + std::to_string(row.version));
        ExpectCreate(MachineWithConf(row.szConf), 1, row.version, 0, row.made);
        EXPECT_EQ(MachineFileRead(ERROR_LOG), std::nullopt);
    }
}

TEST(PartitionCreateSystem, GivesTheToolsNothingToReadOrToSay)
{
    const RUN_RESULT result = ExpectCreate(MachineWithConf(CONF_RAID), 1, 8, 0, MADE_8);
    for (const RUN_EVENT &event : result.events) {
        EXPECT_TRUE(event.fNullInput);
        EXPECT_TRUE(event.fNullOutput);
        EXPECT_FALSE(event.fNullError);
    }
}

TEST(PartitionCreateSystem, EndsWithTheCommandThatFails)
{
    const STEP unsigned255 = {
        "<11>partition_edit.cpp:# Failed to partition disk /dev/sda, err=255"};
    const MACHINE machine = MachineWithConf(CONF_RAID);
    ExpectCreate(WithTool(machine, "/sbin/sfdisk", TOOL_KIND::MISSING), 1, 8, -1,
                 {{"<11>partition_edit.cpp:# Failed to add ms-dos signature to /dev/sda, "
                   "err=32512"},
                  unsigned255});
    ExpectCreate(machine, 1, 8, -1,
                 {MADE_8[0],
                  {MADE_8[1].szText, {.status = 3}},
                  {"<11>partition_edit.cpp:# Failed to partition disk /dev/sda, err=768"}});
    ExpectCreate(machine, 1, 8, -1,
                 {MADE_8[0],
                  MADE_8[1],
                  {MADE_8[2].szText, {.status = 1}},
                  {"<11>partition_edit.cpp:# Failed to [/sbin/sfdisk -N2 -uS -q -f -j0 "
                   "-z4194304 -tfd -F /dev/sda], err=256"}});
    ExpectCreate(machine, 1, 8, -1,
                 {{MADE_8[0].szText, {.szErr = "no such disk\n", .status = 1}},
                  {"<11>partition_edit.cpp:# Failed to add ms-dos signature to /dev/sda, err=256"},
                  unsigned255});
    EXPECT_EQ(MachineFileRead(ERROR_LOG),
              "Nov 05 01:02:03 command=\"/sbin/sfdisk -M1 /dev/sda\" Error=\"no such disk \"\n");
}

// ---- the data partition ------------------------------------------------------------------------

struct DATA_CASE {
    std::string szConf;
    u32 version;
    const char *szGap;
    const char *szType;
};

const DATA_CASE DATA_CASES[] = {
    {CONF_RAID, 8, "-j260352", "-tfd"},    {CONF_RAID, 0, "-j260352", "-tfd"},
    {CONF_RAID, 7, "-j262144", "-tfd"},    {CONF_RAID, 6, "-j257040", "-tfd"},
    {CONF_RAID, 2, "-j257040", "-tfd"},    {CONF_RAID, 1, "-j273105", "-tfd"},
    {CONF_NO_RAID, 8, "-j260352", "-t83"}, {CONF_NO_RAID, 5, "-j16002", "-t83"},
    {CONF_NO_RAID, 3, "-j16002", "-t83"},  {CONF_NO_RAID, 1, "-j273042", "-t83"},
    {CONF_BUILDIN, 8, "-j524288", "-t83"},
};

STEP Data(const std::string &szGap, const std::string &szType, const TOOL_ANSWER &answer = {})
{
    return {"/sbin/sfdisk -N3 \"\" -uS -q -f " + szGap + " -z-1 " + szType + " -F /dev/@", answer};
}

TEST(PartitionCreateData, TakesTheRestOfTheDiskBehindTheGap)
{
    for (const DATA_CASE &row : DATA_CASES) {
        for (const int kind : {2, 3}) { // with both bits the data partition alone
            SCOPED_TRACE(row.szConf + std::to_string(row.version));
            ExpectCreate(MachineWithConf(row.szConf), kind, row.version, 0,
                         {Data(row.szGap, row.szType)});
        }
    }
}

TEST(PartitionCreateData, TellsTheCommandThatFails)
{
    const std::string szTold = "<11>partition_edit.cpp:# Failed to [/sbin/sfdisk -N3  -uS -q -f "
                               "-j260352 -z-1 -tfd -F /dev/sda], err=";
    const MACHINE machine = MachineWithConf(CONF_RAID);
    ExpectCreate(machine, 2, 8, -1, {Data("-j260352", "-tfd", {.signal = 9}), {szTold + "9"}});
    ExpectCreate(
        machine, 2, 8, -1,
        {Data("-j260352", "-tfd", {.szErr = "does not fit\n", .status = 1}), {szTold + "256"}});
    EXPECT_EQ(MachineFileRead(ERROR_LOG),
              "Nov 05 01:02:03 command=\"/sbin/sfdisk -N3  -uS -q -f -j260352 -z-1 -tfd -F "
              "/dev/sda\" Error=\"does not fit \"\n");
}

// ---- which version -----------------------------------------------------------------------------

// Of a disk that has none, or fits no row, the machine's.
TEST(PartitionCreateVersion, IsThatOfTheDiskUnlessGiven)
{
    const MACHINE six = With(MachineOfDisks({{"sdb", PLACES_6}}),
                             [](MACHINE &machine) { SystemArrayAdd(machine, {{"sdb1"}}); });
    MACHINE foreign = six;
    PartitionedDiskAdd(foreign, "sda", PLACES_FOREIGN);
    ExpectCreate(MachineOfDisks({{"sda", PLACES_7}}), 2, {}, 0, {Data("-j262144", "-tfd")});
    ExpectCreate(MachineOfDisks({{"sda", PLACES_8}}), 2, {}, 0, {Data("-j260352", "-tfd")});
    ExpectCreate(foreign, 2, {}, 0, {Data("-j257040", "-tfd")});
    ExpectCreate(six, 2, {}, 0,
                 {{"<15>partition_layout.cpp:# /dev/sda: dont contain partition [1]"},
                  Data("-j257040", "-tfd")});
}

TEST(PartitionCreateVersion, ThatCannotBeFoundEndsIt)
{
    ExpectCreate(WithFault(MachineOfDisks({{"sda", BLANK}}), {.szFunction = "glob", .error = EIO}),
                 2, {}, -1,
                 {{"<15>partition_layout.cpp:# /dev/sda: dont contain partition [1]"},
                  {"fault glob 1"},
                  {"<11>partition_edit.cpp:# Failed to get partition version"}});
}

struct ROWLESS_CASE {
    std::string szConf;
    u32 version;
    const char *szVersion;
};

TEST(PartitionCreateVersion, WithoutARowEndsIt)
{
    const ROWLESS_CASE CASES[] = {
        {CONF_RAID, 4, "4"},
        {CONF_RAID, 3, "3"},
        {CONF_RAID, 5, "5"},
        {CONF_RAID, 99, "99"},
        {CONF_RAID, 0xFFFFFFFF, "-1"},
        {CONF_NO_RAID, 4, "4"},
        {CONF_BUILDIN, 6, "6"},
        {"supportraid=yes\nsupport_buildin_storage=yes\n", 8, "8"},
        {"supportraid=yes\nsupport_buildin_storage=yes\n", 0, "0"}, // as it is held
    };
    for (const ROWLESS_CASE &row : CASES) {
        for (const int kind : {0, 1, 2, 3}) {
            SCOPED_TRACE(row.szConf + std::to_string(row.version));
            ExpectCreate(MachineWithConf(row.szConf), kind, row.version, -1,
                         {{std::string("<11>partition_edit.cpp:# Failed to get partition layout: "
                                       "version=") +
                           row.szVersion}});
        }
    }
}

TEST(PartitionCreateKind, WithNeitherBitIsFoundOutAtTheEnd)
{
    for (const int kind : {0, 4, 128}) {
        ExpectCreate(MachineWithConf(CONF_RAID), kind, 8, -1,
                     {{"<11>partition_edit.cpp:# Failed to [], err=-1"}});
    }
}

// ---- cleaning ----------------------------------------------------------------------------------

struct CLEAN_CASE {
    int mode;
    const char *szRange;
};

constexpr CLEAN_CASE CLEAN_CASES[] = {
    {1, "1:2"}, {2, "3:128"}, {3, "-1"}, {0, ""}, {4, ""}, {-1, ""},
};

TEST(PartitionClean, DeletesTheRangeOfTheModeAndWritesASignature)
{
    for (const CLEAN_CASE &row : CLEAN_CASES) {
        SCOPED_TRACE(row.mode);
        const std::string szCommand = "/sbin/sfdisk --fast-delete " +
                                      std::string(*row.szRange == '\0' ? "\"\"" : row.szRange) +
                                      " /dev/sda";
        const std::string szTold =
            std::string("<15>partition_edit.cpp:# Failed to do '/sbin/sfdisk --fast-delete ") +
            row.szRange + " /dev/sda'";
        const auto call = [&row] { return PartitionClean("/dev/sda", row.mode); };
        ExpectCalls({{.szName = "both succeed",
                      .call = call,
                      .steps = {{szCommand}, {"/sbin/sfdisk -M1 /dev/sda"}}},
                     {.szName = "both fail",
                      .call = call,
                      .steps = {{szCommand, {.status = 1}},
                                {szTold},
                                {"/sbin/sfdisk -M1 /dev/sda", {.status = 2}},
                                {"<11>partition_edit.cpp:# Failed to add ms-dos signature to "
                                 "/dev/sda, err=512"}}}});
    }
}

TEST(PartitionTable, GetsAnMsDosSignature)
{
    const STEP signature = {"/sbin/sfdisk -M1 /dev/sdc"};
    const std::string szTold =
        "<11>partition_edit.cpp:# Failed to add ms-dos signature to /dev/sdc, err=";
    const auto call = [] { return PartitionTableAdd("/dev/sdc"); };
    ExpectCalls({{.szName = "done", .call = call, .steps = {signature}},
                 {.szName = "failed",
                  .call = call,
                  .result = -1,
                  .steps = {{signature.szText, {.status = 1}}, {szTold + "256"}}},
                 // The runner's own failure is no exit status.
                 {.szName = "no process",
                  .machine = WithFault(MachineMake(), {.szFunction = "fork", .error = EAGAIN}),
                  .call = call,
                  .result = -1,
                  .code = ERR_BAD_PARAMETER,
                  .steps = {{"fault fork 1"}, {szTold + "-1"}}}});
}

// ---- wiping a superblock -----------------------------------------------------------------------

TEST(PartitionZero, WipesThePartitionsSuperblock)
{
    ExpectCalls({{.szName = "sda1",
                  .call = [] { return PartitionZeroSuperblock("/dev/sda", 1); },
                  .steps = {{"/sbin/mdadm --zero-superblock /dev/sda1"}}},
                 {.szName = "with a p",
                  .call = [] { return PartitionZeroSuperblock("/dev/mmcblk0", 2); },
                  .steps = {{"/sbin/mdadm --zero-superblock /dev/mmcblk0p2"}}},
                 {.szName = "by its name",
                  .call = [] { return PartitionZeroSuperblock("sdb", 5); },
                  .steps = {{"/sbin/mdadm --zero-superblock /dev/sdb5"}}},
                 {.szName = "it fails in silence",
                  .call = [] { return PartitionZeroSuperblock("/dev/sda", 1); },
                  .result = -1,
                  .steps = {{"/sbin/mdadm --zero-superblock /dev/sda1", {.status = 1}}}},
                 {.szName = "the boot device has none",
                  .call = [] { return PartitionZeroSuperblock("/dev/nuroboot", 1); },
                  .result = -1,
                  .steps = {{"<11>disk_name.cpp:# we don't generate nuroboot partition name here"},
                            {"<11>disk_name.cpp:# fail to get device partition name"}}}});
}

// ---- bad arguments to all modules of partitions ------------------------------------------------

u64 sectorsOut = 0;
u32 typeOut = 0;
u32 versionGiven = 8;
PNLIBSZLIST pNone = nullptr;
constexpr char EDIT_REFUSES[] = "<11>partition_edit.cpp:# Bad parameters";
constexpr char ENUM_REFUSES[] = "<11>partition_enum.cpp:# bad parameters";
constexpr char NO_NAME[] = "<11>disk_name.cpp:# out put szPartitionPath can not be NULL and "
                           "path length can't be zero";

struct BAD_CASE {
    const char *szName;
    long long (*pCall)();
    u32 code = OLD_CODE;
    const char *szLog = nullptr;
};

constexpr BAD_CASE BAD_CASES[] = {
    {"create, no disk", [] { return 0LL + PartitionCreate(nullptr, 1, &versionGiven); }, OLD_CODE,
     EDIT_REFUSES},
    {"clean, no disk", [] { return 0LL + PartitionClean(nullptr, 3); }, OLD_CODE, EDIT_REFUSES},
    {"signature, no disk", [] { return 0LL + PartitionTableAdd(nullptr); }, OLD_CODE, EDIT_REFUSES},
    {"wipe, no disk", [] { return 0LL + PartitionZeroSuperblock(nullptr, 1); }, OLD_CODE,
     EDIT_REFUSES},
    {"wipe, 0", [] { return 0LL + PartitionZeroSuperblock("/dev/sda", 0); }, OLD_CODE,
     EDIT_REFUSES},
    {"wipe, -1", [] { return 0LL + PartitionZeroSuperblock("/dev/sda", -1); }, OLD_CODE,
     EDIT_REFUSES},
    {"geometry, 0",
     [] { return 0LL + PartitionGeometryGet(0, "/dev/sdb", &sectorsOut, &typeOut); }},
    {"geometry, -1",
     [] { return 0LL + PartitionGeometryGet(-1, "/dev/sdb", &sectorsOut, &typeOut); }},
    {"geometry, the lowest",
     [] { return 0LL + PartitionGeometryGet(INT_MIN, "/dev/sdb", &sectorsOut, &typeOut); }},
    {"geometry, no disk",
     [] { return 0LL + PartitionGeometryGet(5, nullptr, &sectorsOut, &typeOut); }},
    {"geometry, no start",
     [] { return 0LL + PartitionGeometryGet(5, "/dev/sdb", nullptr, &typeOut); }},
    {"geometry, no typeOut",
     [] { return 0LL + PartitionGeometryGet(5, "/dev/sdb", &sectorsOut, nullptr); }},
    {"place, no disk",
     [] { return 0LL + PartitionStartSizeGet(nullptr, 1, &sectorsOut, &sectorsOut); },
     ERR_BAD_PARAMETER},
    {"place, no start", [] { return 0LL + PartitionStartSizeGet("sda", 1, nullptr, &sectorsOut); },
     ERR_BAD_PARAMETER},
    {"place, no size", [] { return 0LL + PartitionStartSizeGet("sda", 1, &sectorsOut, nullptr); },
     ERR_BAD_PARAMETER},
    {"place, 0", [] { return 0LL + PartitionStartSizeGet("sda", 0, &sectorsOut, &sectorsOut); },
     OLD_CODE, NO_NAME},
    {"place, -1", [] { return 0LL + PartitionStartSizeGet("sda", -1, &sectorsOut, &sectorsOut); },
     OLD_CODE, NO_NAME},
    {"place, the boot device",
     [] { return 0LL + PartitionStartSizeGet("/dev/nuroboot", 1, &sectorsOut, &sectorsOut); },
     OLD_CODE, "<11>disk_name.cpp:# we don't generate nuroboot partition name here"},
    {"version, nowhere to", [] { return 0LL + PartitionLayoutGetMax(nullptr, 0); }},
    {"biggest version, nowhere to", [] { return 0LL + PartitionLayoutGetMax(nullptr, 1); }},
    {"first version, nowhere to", [] { return 0LL + PartitionLayoutGet(nullptr); }},
    {"enumeration, no place", [] { return 0LL + PartitionPathEnum(nullptr, nullptr); }, OLD_CODE,
     ENUM_REFUSES},
    {"enumeration, no list", [] { return 0LL + PartitionPathEnum(nullptr, &pNone); }, OLD_CODE,
     ENUM_REFUSES},
};

// And nothing is stored.
TEST(Partition, BadArgumentsAreTold)
{
    for (const BAD_CASE &row : BAD_CASES) {
        ExpectCall({.szName = row.szName,
                    .call =
                        [&row] {
                            const long long result = row.pCall();
                            EXPECT_EQ(sectorsOut, 0U);
                            EXPECT_EQ(typeOut, 0U);
                            return result;
                        },
                    .result = -1,
                    .code = row.code,
                    .steps = row.szLog == nullptr ? STEPS{} : STEPS{{row.szLog}}});
    }
}

// ---- asking for one partition ------------------------------------------------------------------

struct LISTED_CASE {
    const char *szLine;
    i64 sectors;
    u64 start;
    u32 type;
};

constexpr LISTED_CASE LISTED_CASES[] = {
    {"/dev/sda1 2048 4982527 4980480 fd\n", 4980480, 2048, 0xfd},
    {"/dev/sda1 2048 4982527 4980480 fd", 4980480, 2048, 0xfd},
    {"/dev/sda1\t2048\t4982527\t4980480\t83\tLinux\n", 4980480, 2048, 0x83},
    {"  /dev/sda1 \t 63   *  \t 4980087  82 \n", 4980087, 63, 0x82},
    {"/dev/sda1 2048 4982527 4980480 fd\n/dev/sda2 1 2 3 4\n", 4980480, 2048, 0xfd},
    // Blanks and tabs end a field, and nothing else does.
    {"/dev/sda\v1 20\v48 4982527 4980480 fd\n", 4980480, 20, 0xfd},
    {"/dev/sda\f1 2048\f1 49\f82527 4980480 fd\n", 4980480, 2048, 0xfd},
    {"/dev/sda\r1 2048 4982527 4980480\r7 fd\n", 4980480, 2048, 0xfd},
    {"/dev/sda~1 2048 4982527 4980480 fd\n", 4980480, 2048, 0xfd}, // no name is asked for
    {"/dev/sda1 1 2 0 f\n", 0, 1, 0xf},
    {"/dev/sda1 1 2 -7 0xee\n", -7, 1, 0xee},
    {"/dev/sda1 18446744073709551615 2 9223372036854775807 ffffffff\n", INT64_MAX, ALL_ONES,
     0xffffffff},
    {"/dev/sda1 none x y zz\n", 0, 0, 0},
};

MACHINE MachineOfListing(const std::string &szOut, const std::string &szDisk = "sda")
{
    MACHINE machine = MachineMake();
    MachineTool(machine, ListingCommand(szDisk, 1), {.szOut = szOut, .szErr = "none\n"});
    return machine;
}

// Of partition 1. Where it is absent, nothing is stored.
void ExpectGeometry(const MACHINE &machine, i64 sectors, u64 start = UNTOUCHED,
                    u32 type = UNTOUCHED, const std::string &szDisk = "/dev/sda")
{
    QuietCall(machine, [&] {
        u64 startRead = UNTOUCHED;
        u32 typeRead = UNTOUCHED;
        EXPECT_EQ(PartitionGeometryGet(1, szDisk.c_str(), &startRead, &typeRead), sectors);
        EXPECT_EQ(startRead, start);
        EXPECT_EQ(typeRead, type);
    });
}

TEST(PartitionGeometry, ReadsTheFieldsOfTheFirstLine)
{
    for (const LISTED_CASE &row : LISTED_CASES) {
        SCOPED_TRACE(row.szLine);
        ExpectGeometry(MachineOfListing(row.szLine), row.sectors, row.start, row.type);
    }
}

TEST(PartitionGeometry, StoresNothingForAnAbsentPartition)
{
    // The new line is no blank: it ends the fourth field's text but makes no fifth one.
    for (const char *const szLine :
         {"", "/dev/sda1", "/dev/sda1 2048 4982527 4980480", "/dev/sda1 2048 4982527\t4980480 "}) {
        SCOPED_TRACE(szLine);
        MACHINE machine = MachineOfListing(szLine);
        machine.rows[0].answer.status = 1;
        ExpectGeometry(machine, -1);
        EXPECT_EQ(MachineFileRead(ERROR_LOG), std::nullopt);
    }
}

TEST(PartitionGeometry, AsksForTheDiskByItsPath)
{
    for (const char *const szDisk : {"sdb", "/dev/sdb"}) {
        const RUN_RESULT result = ExpectCall(
            {.szName = szDisk,
             .call =
                 [szDisk] {
                     u64 start = 0;
                     u32 type = 0;
                     return PartitionGeometryGet(5, szDisk, &start, &type);
                 },
             .result = 3,
             .steps = {{"/sbin/sfdisk -l -uS -N5 /dev/sdb", {.szOut = "/dev/sdb5 1 2 3 4\n"}}}});
        ASSERT_EQ(result.events.size(), 1U);
        EXPECT_TRUE(result.events[0].fNullInput);
        EXPECT_TRUE(result.events[0].fNullError);
    }
}

// "/dev/" and 58 characters of a name.
TEST(PartitionGeometry, CutsThePathToSixtyThreeCharacters)
{
    const std::string szDisk(58, 'x');
    for (const std::string &szName : {szDisk, szDisk + "y", "/dev/" + szDisk + "yz"}) {
        ExpectGeometry(MachineOfListing("/dev/x1 1 2 3 4\n", szDisk), 3, 1, 4, szName);
    }
}

TEST(PartitionGeometry, TakesAPartitionerThatCannotBeRunForNone)
{
    for (const TOOL_KIND kind :
         {TOOL_KIND::MISSING, TOOL_KIND::FOLDER, TOOL_KIND::NOT_EXECUTABLE}) {
        ExpectGeometry(WithTool(MachineMake(), "/sbin/sfdisk", kind), -1);
    }
    for (const char *const szFunction : {"fork", "pipe2", "fdopen"}) {
        MACHINE machine =
            WithFault(MachineOfListing(""), {.szFunction = szFunction, .error = EMFILE});
        machine.rows[0].answer.nTimes = ANY_TIMES;
        machine.fMayLeaveChildren = true; // one whose stream could not be had is not waited for
        ExpectGeometry(machine, -1);
    }
}

// Of a longer line the first 256 bytes are read, here the type or half of it.
TEST(PartitionGeometry, ReadsNoFurtherThan256Bytes)
{
    const std::string szFields = "/dev/sda1 1 2 3";
    const std::string szBlanks(256 - szFields.size() - 2, ' ');
    ExpectGeometry(MachineOfListing(szFields + szBlanks + "83 Linux\n"), 3, 1, 0x83);
    ExpectGeometry(MachineOfListing(szFields + szBlanks + " 83 Linux\n"), 3, 1, 0x8);
}

// However much more is said, and in one line.
TEST(PartitionGeometry, ReadsTheBeginningOfALongLine)
{
    ExpectGeometry(MachineOfListing("/dev/sda1 1 2 3 83 " + std::string(100000, 'x')), 3, 1, 0x83);
}

} // namespace
