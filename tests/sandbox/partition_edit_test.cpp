// SPDX-License-Identifier: MIT
#include "nurostoragecore/partition_edit.h"

#include "nurocore/error.h"
#include "steps.h"
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

// Each of these is run once and succeeds.
MACHINE MachineOfCommands(const std::string &szConf, const std::vector<std::string> &commands)
{
    MACHINE machine = MachineWithConf(szConf);
    for (const std::string &szCommand : commands) {
        MachineTool(machine, szCommand);
    }
    return machine;
}

RUN_RESULT Create(const MACHINE &machine, const char *szDisk, int kind, std::optional<u32> version,
                  int resultExpected)
{
    return MachineCall(machine, [=] {
        const u32 wanted = version.value_or(0);
        EXPECT_QUIET(PartitionCreate(szDisk, kind, version ? &wanted : nullptr),
                     resultExpected); // it has no code of its own
    });
}

// ---- system and swap partitions ----------------------------------------------------------------

struct SYSTEM_CASE {
    const char *szConf;
    u32 version;
    const char *szFirst;
    const char *szSecond;
};

constexpr SYSTEM_CASE SYSTEM_CASES[] = {
    {CONF_RAID, 8, "-N1 -uS -q -f -j2048 -z4980480 -tfd", "-N2 -uS -q -f -j0 -z4194304 -tfd"},
    {CONF_RAID, 0, "-N1 -uS -q -f -j2048 -z4980480 -tfd", "-N2 -uS -q -f -j0 -z4194304 -tfd"},
    {CONF_RAID, 7, "-N1 -uS -q -f -j256 -z4980480 -tfd", "-N2 -uS -q -f -j0 -z4194304 -tfd"},
    {CONF_RAID, 6, "-N1 -uS -q -f -j63 -z4980087 -tfd", "-N2 -uS -q -f -j0 -z4192965 -tfd"},
    {CONF_RAID, 2, "-N1 -uS -q -f -j63 -z4980087 -tfd", "-N2 -uS -q -f -j0 -z1044225 -tfd"},
    {CONF_RAID, 1, "-N1 -uS -q -f -j63 -z1574307 -tfd", "-N2 -uS -q -f -j0 -z787185 -tfd"},
    {CONF_NO_RAID, 8, "-N1 -uS -q -f -j2048 -z4980480 -t83", "-N2 -uS -q -f -j0 -z4194304 -t82"},
    {CONF_NO_RAID, 7, "-N1 -uS -q -f -j256 -z4980480 -t83", "-N2 -uS -q -f -j0 -z4194304 -t82"},
    {CONF_NO_RAID, 6, "-N1 -uS -q -f -j63 -z4980087 -t83", "-N2 -uS -q -f -j0 -z4192965 -t82"},
    {CONF_NO_RAID, 5, "-N1 -uS -q -f -j63 -z722862 -t83", "-N2 -uS -q -f -j0 -z594405 -t82"},
    {CONF_NO_RAID, 3, "-N1 -uS -q -f -j63 -z530082 -t83", "-N2 -uS -q -f -j0 -z787185 -t82"},
    {CONF_NO_RAID, 2, "-N1 -uS -q -f -j63 -z4980087 -t83", "-N2 -uS -q -f -j0 -z1044225 -t82"},
    {CONF_NO_RAID, 1, "-N1 -uS -q -f -j63 -z273042 -t83", "-N2 -uS -q -f -j0 -z787185 -t82"},
    // The row says 83 for partition 2; the model decides.
    {CONF_BUILDIN, 7, "-N1 -uS -q -f -j256 -z2097152 -t83", "-N2 -uS -q -f -j0 -z5105569 -t82"},
    {CONF_BUILDIN, 8, "-N1 -uS -q -f -j256 -z2097152 -t83", "-N2 -uS -q -f -j0 -z5105569 -t82"},
    {CONF_BUILDIN, 0, "-N1 -uS -q -f -j256 -z2097152 -t83", "-N2 -uS -q -f -j0 -z5105569 -t82"},
};

TEST(PartitionCreateSystem, WritesASignatureAndTheTwoPartitionsOfTheVersion)
{
    for (const SYSTEM_CASE &row : SYSTEM_CASES) {
        SCOPED_TRACE(std::string(row.szConf) + std::to_string(row.version));
        const std::vector<std::string> commands = {
            "/sbin/sfdisk -M1 /dev/sdb",
            std::string("/sbin/sfdisk ") + row.szFirst + " -F /dev/sdb",
            std::string("/sbin/sfdisk ") + row.szSecond + " -F /dev/sdb",
        };
        const RUN_RESULT result =
            Create(MachineOfCommands(row.szConf, commands), "/dev/sdb", 1, row.version, 0);
        EXPECT_EQ(TranscriptText(result), Lines(commands));
        EXPECT_EQ(LogText(result), "");
        EXPECT_EQ(MachineFileRead(ERROR_LOG), std::nullopt);
    }
}

TEST(PartitionCreateSystem, GivesTheToolsNothingToReadOrToSay)
{
    const RUN_RESULT result =
        Create(MachineOfCommands(CONF_RAID,
                                 {"/sbin/sfdisk -M1 /dev/sdb",
                                  "/sbin/sfdisk -N1 -uS -q -f -j2048 -z4980480 -tfd -F /dev/sdb",
                                  "/sbin/sfdisk -N2 -uS -q -f -j0 -z4194304 -tfd -F /dev/sdb"}),
               "/dev/sdb", 1, 8, 0);
    for (const RUN_EVENT &event : result.events) {
        EXPECT_TRUE(event.fNullInput);
        EXPECT_TRUE(event.fNullOutput);
        EXPECT_FALSE(event.fNullError);
    }
}

long long CreateSystem8()
{
    const u32 version = 8;
    return PartitionCreate("/dev/sdb", 1, &version);
}

TEST(PartitionCreateSystem, EndsWithTheCommandThatFails)
{
    const STEP signature = {"/sbin/sfdisk -M1 /dev/sdb"};
    const STEP first = {"/sbin/sfdisk -N1 -uS -q -f -j2048 -z4980480 -tfd -F /dev/sdb"};
    const STEP second = {"/sbin/sfdisk -N2 -uS -q -f -j0 -z4194304 -tfd -F /dev/sdb"};
    const STEP unsigned255 = {
        "<11>partition_edit.cpp:# Failed to partition disk /dev/sdb, err=255"};
    const MACHINE machine = MachineWithConf(CONF_RAID);
    ExpectCalls(
        {{.szName = "no partitioner",
          .machine = WithTool(machine, "/sbin/sfdisk", TOOL_KIND::MISSING),
          .call = CreateSystem8,
          .result = -1,
          .steps = {{"<11>partition_edit.cpp:# Failed to add ms-dos signature to /dev/sdb, "
                     "err=32512"},
                    unsigned255}},
         {.szName = "partition 1",
          .machine = machine,
          .call = CreateSystem8,
          .result = -1,
          .steps = {signature,
                    {first.szText, {.status = 3}},
                    {"<11>partition_edit.cpp:# Failed to partition disk /dev/sdb, err=768"}}},
         {.szName = "partition 2",
          .machine = machine,
          .call = CreateSystem8,
          .result = -1,
          .steps = {signature,
                    first,
                    {second.szText, {.status = 1}},
                    {"<11>partition_edit.cpp:# Failed to [/sbin/sfdisk -N2 -uS -q -f -j0 "
                     "-z4194304 -tfd -F /dev/sdb], err=256"}}},
         {.szName = "the signature",
          .machine = machine,
          .call = CreateSystem8,
          .result = -1,
          .steps = {{signature.szText, {.szErr = "no such disk\n", .status = 1}},
                    {"<11>partition_edit.cpp:# Failed to add ms-dos signature to /dev/sdb, "
                     "err=256"},
                    unsigned255}}});
    EXPECT_EQ(MachineFileRead(ERROR_LOG),
              "Nov 05 01:02:03 command=\"/sbin/sfdisk -M1 /dev/sdb\" Error=\"no such disk \"\n");
}

// ---- the data partition ------------------------------------------------------------------------

struct DATA_CASE {
    const char *szConf;
    u32 version;
    const char *szGap;
    const char *szType;
};

constexpr DATA_CASE DATA_CASES[] = {
    {CONF_RAID, 8, "-j260352", "-tfd"},    {CONF_RAID, 0, "-j260352", "-tfd"},
    {CONF_RAID, 7, "-j262144", "-tfd"},    {CONF_RAID, 6, "-j257040", "-tfd"},
    {CONF_RAID, 2, "-j257040", "-tfd"},    {CONF_RAID, 1, "-j273105", "-tfd"},
    {CONF_NO_RAID, 8, "-j260352", "-t83"}, {CONF_NO_RAID, 5, "-j16002", "-t83"},
    {CONF_NO_RAID, 3, "-j16002", "-t83"},  {CONF_NO_RAID, 1, "-j273042", "-t83"},
    {CONF_BUILDIN, 8, "-j524288", "-t83"},
};

std::vector<std::string> DataCommand(const char *szGap, const char *szType, const char *szDisk)
{
    return {"/sbin/sfdisk", "-N3", "", "-uS", "-q", "-f", szGap, "-z-1", szType, "-F", szDisk};
}

TEST(PartitionCreateData, TakesTheRestOfTheDiskBehindTheGap)
{
    for (const DATA_CASE &row : DATA_CASES) {
        for (const int kind : {2, 3}) { // with both bits the data partition alone
            SCOPED_TRACE(std::string(row.szConf) + std::to_string(row.version));
            MACHINE machine = MachineWithConf(row.szConf);
            MachineTool(machine, DataCommand(row.szGap, row.szType, "/dev/sda"));
            const RUN_RESULT result = Create(machine, "/dev/sda", kind, row.version, 0);
            EXPECT_EQ(TranscriptText(result), std::string("/sbin/sfdisk -N3 \"\" -uS -q -f ") +
                                                  row.szGap + " -z-1 " + row.szType +
                                                  " -F /dev/sda\n");
            EXPECT_EQ(LogText(result), "");
        }
    }
}

TEST(PartitionCreateData, TellsTheCommandThatFails)
{
    const std::string szCommand = "/sbin/sfdisk -N3 \"\" -uS -q -f -j260352 -z-1 -tfd -F /dev/sda";
    const std::string szTold = "<11>partition_edit.cpp:# Failed to [/sbin/sfdisk -N3  -uS -q -f "
                               "-j260352 -z-1 -tfd -F /dev/sda], err=";
    const auto call = [] {
        const u32 version = 8;
        return PartitionCreate("/dev/sda", 2, &version);
    };
    ExpectCalls(
        {{.szName = "killed",
          .machine = MachineWithConf(CONF_RAID),
          .call = call,
          .result = -1,
          .steps = {{szCommand, {.signal = 9}}, {szTold + "9"}}},
         {.szName = "refused",
          .machine = MachineWithConf(CONF_RAID),
          .call = call,
          .result = -1,
          .steps = {{szCommand, {.szErr = "does not fit\n", .status = 1}}, {szTold + "256"}}}});
    EXPECT_EQ(MachineFileRead(ERROR_LOG),
              "Nov 05 01:02:03 command=\"/sbin/sfdisk -N3  -uS -q -f -j260352 -z-1 -tfd -F "
              "/dev/sda\" Error=\"does not fit \"\n");
}

// ---- which version -----------------------------------------------------------------------------

// Of a disk that has none, or fits no row, the machine's.
TEST(PartitionCreateVersion, IsThatOfTheDiskUnlessGiven)
{
    MACHINE six = MachineWithConf(CONF_RAID);
    PartitionedDiskAdd(six, "sdb", PLACES_6);
    SystemArrayAdd(six, {{"sdb1"}});
    const struct {
        const char *szName;
        MACHINE machine;
        const DISK_PLACES *pPlaces;
        const char *szGap;
        const char *szLog = "";
    } cases[] = {
        {"7", MachineWithConf(CONF_RAID), &PLACES_7, "-j262144"},
        {"8", MachineWithConf(CONF_RAID), &PLACES_8, "-j260352"},
        {"no row", six, &PLACES_FOREIGN, "-j257040"},
        {"blank", six, nullptr, "-j257040",
         "<15>partition_layout.cpp:# /dev/sda: dont contain partition [1]\n"},
    };
    for (const auto &row : cases) {
        SCOPED_TRACE(row.szName);
        MACHINE machine = row.machine;
        if (row.pPlaces != nullptr) {
            PartitionedDiskAdd(machine, "sda", *row.pPlaces);
        }
        MachineTool(machine, DataCommand(row.szGap, "-tfd", "/dev/sda"));
        EXPECT_EQ(LogText(Create(machine, "/dev/sda", 2, std::nullopt, 0)), row.szLog);
    }
}

TEST(PartitionCreateVersion, ThatCannotBeFoundEndsIt)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineDiskAdd(machine, "sda");
    machine.faults = {{.szFunction = "glob", .nCall = 1, .error = EIO}};
    const RUN_RESULT result = Create(machine, "/dev/sda", 2, std::nullopt, -1);
    EXPECT_EQ(LogErrors(result), "<11>partition_edit.cpp:# Failed to get partition version\n");
    EXPECT_EQ(TranscriptText(result), "fault glob 1\n");
}

struct ROWLESS_CASE {
    const char *szConf;
    u32 version;
    const char *szVersion;
};

TEST(PartitionCreateVersion, WithoutARowEndsIt)
{
    constexpr ROWLESS_CASE CASES[] = {
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
            SCOPED_TRACE(std::string(row.szConf) + std::to_string(row.version));
            const RUN_RESULT result =
                Create(MachineWithConf(row.szConf), "/dev/sda", kind, row.version, -1);
            EXPECT_EQ(LogText(result),
                      std::string("<11>partition_edit.cpp:# Failed to get partition layout: "
                                  "version=") +
                          row.szVersion + "\n");
            EXPECT_EQ(TranscriptText(result), "");
        }
    }
}

TEST(PartitionCreateKind, WithNeitherBitIsFoundOutAtTheEnd)
{
    for (const int kind : {0, 4, 128}) {
        const RUN_RESULT result = Create(MachineWithConf(CONF_RAID), "/dev/sda", kind, 8, -1);
        EXPECT_EQ(LogText(result), "<11>partition_edit.cpp:# Failed to [], err=-1\n");
        EXPECT_EQ(TranscriptText(result), "");
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

TEST(PartitionEdit, BadArgumentsAreTold)
{
    const STEPS told = {{"<11>partition_edit.cpp:# Bad parameters"}};
    const u32 version = 8;
    const std::function<long long()> calls[] = {
        [&version] { return PartitionCreate(nullptr, 1, &version); },
        [] { return PartitionClean(nullptr, 3); },
        [] { return PartitionTableAdd(nullptr); },
        [] { return PartitionZeroSuperblock(nullptr, 1); },
        [] { return PartitionZeroSuperblock("/dev/sda", 0); },
        [] { return PartitionZeroSuperblock("/dev/sda", -1); }};
    for (size_t i = 0; i < std::size(calls); i++) {
        SCOPED_TRACE(i);
        ExpectCalls({{.szName = "refused", .call = calls[i], .result = -1, .steps = told}});
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

TEST(PartitionGeometry, ReadsTheFieldsOfTheFirstLine)
{
    for (const LISTED_CASE &row : LISTED_CASES) {
        SCOPED_TRACE(row.szLine);
        MACHINE machine = MachineMake();
        MachineTool(machine, "/sbin/sfdisk -l -uS -N1 /dev/sda", {.szOut = row.szLine});
        QuietCall(machine, [&row] {
            u64 start = UNTOUCHED;
            u32 type = UNTOUCHED;
            EXPECT_EQ(PartitionGeometryGet(1, "/dev/sda", &start, &type), row.sectors);
            EXPECT_EQ(start, row.start);
            EXPECT_EQ(type, row.type);
        });
    }
}

TEST(PartitionGeometry, StoresNothingForAnAbsentPartition)
{
    // The new line is no blank: it ends the fourth field's text but makes no fifth one.
    for (const char *const szLine :
         {"", "/dev/sda1", "/dev/sda1 2048 4982527 4980480", "/dev/sda1 2048 4982527\t4980480 "}) {
        SCOPED_TRACE(szLine);
        MACHINE machine = MachineMake();
        MachineTool(machine, "/sbin/sfdisk -l -uS -N1 /dev/sda",
                    {.szOut = szLine, .szErr = "none\n", .status = 1});
        QuietCall(machine, [] {
            u64 start = UNTOUCHED;
            u32 type = UNTOUCHED;
            EXPECT_EQ(PartitionGeometryGet(1, "/dev/sda", &start, &type), -1);
            EXPECT_EQ(start, UNTOUCHED);
            EXPECT_EQ(type, UNTOUCHED);
        });
        EXPECT_EQ(MachineFileRead(ERROR_LOG), std::nullopt);
    }
}

TEST(PartitionGeometry, AsksForTheDiskByItsPath)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, "/sbin/sfdisk -l -uS -N5 /dev/sdb",
                {.szOut = "/dev/sdb5 1 2 3 4\n", .nTimes = 2});
    const RUN_RESULT result = QuietCall(machine, [] {
        u64 start = 0;
        u32 type = 0;
        EXPECT_EQ(PartitionGeometryGet(5, "sdb", &start, &type), 3);
        EXPECT_EQ(PartitionGeometryGet(5, "/dev/sdb", &start, &type), 3);
        EXPECT_EQ(PartitionGeometryGet(0, "/dev/sdb", &start, &type), -1);
        EXPECT_EQ(PartitionGeometryGet(-1, "/dev/sdb", &start, &type), -1);
        EXPECT_EQ(PartitionGeometryGet(INT_MIN, "/dev/sdb", &start, &type), -1);
        EXPECT_EQ(PartitionGeometryGet(5, nullptr, &start, &type), -1);
        EXPECT_EQ(PartitionGeometryGet(5, "/dev/sdb", nullptr, &type), -1);
        EXPECT_EQ(PartitionGeometryGet(5, "/dev/sdb", &start, nullptr), -1);
    });
    ASSERT_EQ(result.events.size(), 2U);
    EXPECT_TRUE(result.events[0].fNullInput);
    EXPECT_TRUE(result.events[0].fNullError);
}

// "/dev/" and 58 characters of a name.
TEST(PartitionGeometry, CutsThePathToSixtyThreeCharacters)
{
    const std::string szDisk(58, 'x');
    MACHINE machine = MachineMake();
    MachineTool(machine, "/sbin/sfdisk -l -uS -N1 /dev/" + szDisk,
                {.szOut = "/dev/x1 1 2 3 4\n", .nTimes = 3});
    MachineCall(machine, [&szDisk] {
        for (const std::string &szName : {szDisk, szDisk + "y", "/dev/" + szDisk + "yz"}) {
            u64 start = 0;
            u32 type = 0;
            EXPECT_EQ(PartitionGeometryGet(1, szName.c_str(), &start, &type), 3) << szName;
        }
    });
}

TEST(PartitionGeometry, TakesAPartitionerThatCannotBeRunForNone)
{
    for (const TOOL_KIND kind :
         {TOOL_KIND::MISSING, TOOL_KIND::FOLDER, TOOL_KIND::NOT_EXECUTABLE}) {
        MACHINE machine = MachineMake();
        machine.tools["/sbin/sfdisk"] = kind;
        QuietCall(machine, [] {
            u64 start = UNTOUCHED;
            u32 type = UNTOUCHED;
            EXPECT_EQ(PartitionGeometryGet(1, "/dev/sda", &start, &type), -1);
            EXPECT_EQ(start, UNTOUCHED);
        });
    }

    for (const char *const szFunction : {"fork", "pipe2", "fdopen"}) {
        MACHINE machine = MachineMake();
        MachineTool(machine, "/sbin/sfdisk -l -uS -N1 /dev/sda", {.nTimes = ANY_TIMES});
        machine.faults = {{.szFunction = szFunction, .error = EMFILE}};
        machine.fMayLeaveChildren = true; // one whose stream could not be had is not waited for
        MachineCall(machine, [] {
            u64 start = UNTOUCHED;
            u32 type = UNTOUCHED;
            EXPECT_EQ(PartitionGeometryGet(1, "/dev/sda", &start, &type), -1);
            EXPECT_EQ(start, UNTOUCHED);
        });
    }
}

// Of a longer line the first 256 bytes are read, here the type or half of it.
TEST(PartitionGeometry, ReadsNoFurtherThan256Bytes)
{
    const std::string szFields = "/dev/sda1 1 2 3";
    const std::string szBlanks(256 - szFields.size() - 2, ' ');
    struct {
        std::string szLine;
        u32 type;
    } const cases[] = {{szFields + szBlanks + "83 Linux\n", 0x83},
                       {szFields + szBlanks + " 83 Linux\n", 0x8}};
    for (const auto &row : cases) {
        MACHINE machine = MachineMake();
        MachineTool(machine, "/sbin/sfdisk -l -uS -N1 /dev/sda", {.szOut = row.szLine});
        MachineCall(machine, [&row] {
            u64 start = 0;
            u32 type = 0;
            EXPECT_EQ(PartitionGeometryGet(1, "/dev/sda", &start, &type), 3);
            EXPECT_EQ(type, row.type);
        });
    }
}

// However much more is said, and in one line.
TEST(PartitionGeometry, ReadsTheBeginningOfALongLine)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, "/sbin/sfdisk -l -uS -N1 /dev/sda",
                {.szOut = "/dev/sda1 1 2 3 83 " + std::string(100000, 'x')});
    MachineCall(machine, [] {
        u64 start = 0;
        u32 type = 0;
        EXPECT_EQ(PartitionGeometryGet(1, "/dev/sda", &start, &type), 3);
        EXPECT_EQ(type, 0x83U);
    });
}

} // namespace
