// SPDX-License-Identifier: MIT
#include "nurostoragecore/partition_layout.h"

#include "nurocore/error.h"
#include "storage_machine.h"

#include <climits>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <string>

namespace
{

constexpr u64 UNTOUCHED = 4711;
constexpr u64 OPEN = 0xFFFFFFFFFFFFFFFFULL; // the data partition takes what the disk has left

struct EXPECTED_ROW {
    u32 version;
    u32 raid;
    u32 buildin;
    u64 start[3];
    u64 size[3];
    u64 dataGap;
    u32 type[3];
};

constexpr EXPECTED_ROW ROWS[] = {
    {1, 0, 0, {63, 273105, OPEN}, {273042, 787185, OPEN}, 273042, {0x83, 0x82, 0x83}},
    {2, 0, 0, {63, 4980150, OPEN}, {4980087, 1044225, OPEN}, 257040, {0x83, 0x82, 0x83}},
    {3, 0, 0, {63, 530145, OPEN}, {530082, 787185, OPEN}, 16002, {0x83, 0x82, 0x83}},
    {5, 0, 0, {63, 722925, OPEN}, {722862, 594405, OPEN}, 16002, {0x83, 0x82, 0x83}},
    {6, 0, 0, {63, 4980150, OPEN}, {4980087, 4192965, OPEN}, 257040, {0x83, 0x82, 0x83}},
    {7, 0, 0, {256, 4980736, OPEN}, {4980480, 4194304, OPEN}, 262144, {0x83, 0x82, 0x83}},
    {8, 0, 0, {2048, 4982528, OPEN}, {4980480, 4194304, OPEN}, 260352, {0x83, 0x82, 0x83}},
    {1, 1, 0, {63, 1574370, OPEN}, {1574307, 787185, OPEN}, 273105, {0xfd, 0xfd, 0xfd}},
    {2, 1, 0, {63, 4980150, OPEN}, {4980087, 1044225, OPEN}, 257040, {0xfd, 0xfd, 0xfd}},
    {6, 1, 0, {63, 4980150, OPEN}, {4980087, 4192965, OPEN}, 257040, {0xfd, 0xfd, 0xfd}},
    {7, 1, 0, {256, 4980736, OPEN}, {4980480, 4194304, OPEN}, 262144, {0xfd, 0xfd, 0xfd}},
    {8, 1, 0, {2048, 4982528, OPEN}, {4980480, 4194304, OPEN}, 260352, {0xfd, 0xfd, 0xfd}},
    {7, 0, 1, {256, 2097408, 7202977}, {2097152, 5105569, 524288}, 524288, {0x83, 0x83, 0x83}},
    {8, 0, 1, {256, 2097408, 7202977}, {2097152, 5105569, 524288}, 524288, {0x83, 0x83, 0x83}},
};

constexpr int ROW_COUNT = static_cast<int>(std::size(ROWS));

// What a disk with the places of the row is taken for: of two rows alike the first.
u32 VersionRead(const EXPECTED_ROW &row)
{
    return row.buildin == 1 ? 7 : row.version;
}

// On the machine, while it runs.
void TextRewrite(const std::string &szPath, const std::string &szText)
{
    (void)std::filesystem::remove(szPath);
    std::ofstream(szPath) << szText;
}

void DiskRewrite(const DISK_PLACES &places)
{
    const u64 numbers[2][2] = {{places.start, places.size}, {places.swapStart, places.swapSize}};
    for (const int partNum : {1, 2}) {
        const std::string szFolder = "/sys/block/sda/sda" + std::to_string(partNum);
        std::filesystem::create_directories(szFolder);
        TextRewrite(szFolder + "/start", std::to_string(numbers[partNum - 1][0]) + "\n");
        TextRewrite(szFolder + "/size", std::to_string(numbers[partNum - 1][1]) + "\n");
    }
}

TEST(PartitionLayoutTable, HoldsItsRowsInTheirOrder)
{
    for (int row = 0; row < ROW_COUNT; row++) {
        SCOPED_TRACE(row);
        const PARTITION_LAYOUT *const pRow = PartitionLayoutAt(row);
        const EXPECTED_ROW &expected = ROWS[row];
        ASSERT_NE(pRow, nullptr);
        EXPECT_EQ(pRow->version, expected.version);
        EXPECT_EQ(pRow->raid, expected.raid);
        EXPECT_EQ(pRow->buildinStorage, expected.buildin);
        EXPECT_EQ(pRow->systemSize, expected.size[0]);
        EXPECT_EQ(pRow->swapSize, expected.size[1]);
        EXPECT_EQ(pRow->dataGap, expected.dataGap);
        for (int i = 0; i < 3; i++) {
            SCOPED_TRACE(i);
            EXPECT_EQ(pRow->partitions[i].start, expected.start[i]);
            EXPECT_EQ(pRow->partitions[i].size, expected.size[i]);
            EXPECT_EQ(pRow->partitions[i].type, expected.type[i]);
        }
    }
}

TEST(PartitionLayoutTable, HasNothingOutsideItsRows)
{
    for (const int row : {-1, ROW_COUNT, ROW_COUNT + 1, INT_MIN, INT_MAX}) {
        EXPECT_EQ(PartitionLayoutAt(row), nullptr) << row;
    }
}

TEST(PartitionLayoutTable, HasPartitionTwoRightBehindPartitionOne)
{
    for (int row = 0; row < ROW_COUNT; row++) {
        const PARTITION_LAYOUT *const pRow = PartitionLayoutAt(row);
        ASSERT_NE(pRow, nullptr);
        EXPECT_EQ(pRow->partitions[0].start + pRow->partitions[0].size, pRow->partitions[1].start);
    }
}

// ---- the row of a version ----------------------------------------------------------------------

struct INDEX_CASE {
    u32 version;
    int rowWithout;
    int rowWithRaid;
};

TEST(PartitionLayoutIndex, IsTheFirstRowThatFits)
{
    constexpr INDEX_CASE CASES[] = {
        {0, 6, 11}, {1, 0, 7},  {2, 1, 8},  {3, 2, -1},  {4, -1, -1},          {5, 3, -1},
        {6, 4, 9},  {7, 5, 10}, {8, 6, 11}, {9, -1, -1}, {0xFFFFFFFF, -1, -1},
    };
    for (const std::string &szConf : {CONF_RAID, CONF_NO_RAID, std::string()}) {
        MachineCall(MachineWithConf(szConf), [&CASES] {
            for (const INDEX_CASE &row : CASES) {
                EXPECT_EQ(PartitionLayoutIndexGet(row.version, 0), row.rowWithout) << row.version;
                EXPECT_EQ(PartitionLayoutIndexGet(row.version, 1), row.rowWithRaid) << row.version;
                EXPECT_EQ(PartitionLayoutIndexGet(row.version, 2), -1) << row.version;
                EXPECT_EQ(PartitionLayoutIndexGet(row.version, -1), -1) << row.version;
            }
        });
    }
}

TEST(PartitionLayoutIndex, KnowsTwoVersionsWithBuiltInStorage)
{
    MachineCall(MachineWithConf(CONF_BUILDIN), [] {
        EXPECT_EQ(PartitionLayoutIndexGet(7, 0), 12);
        EXPECT_EQ(PartitionLayoutIndexGet(8, 0), 13);
        EXPECT_EQ(PartitionLayoutIndexGet(0, 0), 13);
        for (const u32 version : {1U, 2U, 3U, 4U, 5U, 6U, 9U}) {
            EXPECT_EQ(PartitionLayoutIndexGet(version, 0), -1) << version;
        }
        for (const u32 version : {0U, 7U, 8U}) {
            EXPECT_EQ(PartitionLayoutIndexGet(version, 1), -1) << version;
        }
    });
}

// ---- RAID support ------------------------------------------------------------------------------

TEST(SupportRaid, IsAskedOnceInAProcess)
{
    for (const bool fRaid : {true, false}) {
        MachineCall(MachineWithConf(fRaid ? CONF_RAID : CONF_NO_RAID), [fRaid] {
            EXPECT_EQ(IsSupportRaid(), fRaid ? 1 : 0);
            TextRewrite("/etc.defaults/nuroinfo.conf", fRaid ? CONF_NO_RAID : CONF_RAID);
            EXPECT_EQ(IsSupportRaid(), fRaid ? 1 : 0);
        });
    }
}

TEST(SupportRaid, IsNoWithoutTheKey)
{
    MachineCall(MachineWithConf("maxdisks=4\n"), [] { EXPECT_EQ(IsSupportRaid(), 0); });
    MachineCall(MachineMake(), [] { EXPECT_EQ(IsSupportRaid(), 0); });
}

// ---- where a partition lies --------------------------------------------------------------------

// The partition lies there and no code is left; or there is none, or it cannot be told.
void ExpectPlace(const char *szDisk, int partNum, u64 startExpected, u64 sizeExpected)
{
    u64 start = UNTOUCHED;
    u64 size = UNTOUCHED;
    EXPECT_QUIET(PartitionStartSizeGet(szDisk, partNum, &start, &size), 1);
    EXPECT_EQ(start, startExpected) << szDisk;
    EXPECT_EQ(size, sizeExpected) << szDisk;
}

void ExpectNoPlace(const char *szDisk, int partNum, int result, u32 code)
{
    SCOPED_TRACE(szDisk + std::to_string(partNum));
    u64 start = UNTOUCHED;
    u64 size = UNTOUCHED;
    EXPECT_FAILS(PartitionStartSizeGet(szDisk, partNum, &start, &size), result, code);
}

TEST(PartitionStartSize, TakesTheDiskWithAndWithoutItsFolder)
{
    MACHINE machine = MachineMake();
    PartitionedDiskAdd(machine, "sda", PLACES_8);
    MachinePartitionAdd(machine, "mmcblk0", 1, 8192, 65536);
    QuietCall(machine, [] {
        ExpectPlace("sda", 1, 2048, 4980480);
        ExpectPlace("/dev/sda", 1, 2048, 4980480);
        ExpectPlace("/dev/sda", 2, 4982528, 4194304);
        ExpectPlace("/dev/mmcblk0", 1, 8192, 65536);
    });
}

TEST(PartitionStartSize, ReadsSixtyFourBitsOfTheFirstLine)
{
    MACHINE machine = MachineMake();
    MachineFile(machine, "/sys/block/sda/sda1/start", "18446744073709551615\n7\n");
    MachineFile(machine, "/sys/block/sda/sda1/size", "4294967296 sectors");
    MachineCall(machine, [] { ExpectPlace("sda", 1, 18446744073709551615ULL, 4294967296ULL); });
}

// Of a longer line the first 128 bytes are read.
TEST(PartitionStartSize, ReadsNoFurtherThan128Bytes)
{
    MACHINE machine = MachineMake();
    MachineFile(machine, "/sys/block/sda/sda1/start", std::string(126, '0') + "12\n");
    MachineFile(machine, "/sys/block/sda/sda1/size", std::string(127, '0') + "12\n");
    MachineCall(machine, [] { ExpectPlace("sda", 1, 12, 1); });
}

TEST(PartitionStartSize, TellsAnAbsentPartitionFromAFailure)
{
    MACHINE machine = MachineOfDisks({{"sda", BLANK}});
    const struct {
        const char *szFile;
        const char *szText;
    } files[] = {{"sda2/size", "1\n"}, {"sda3/start", "1\n"},    {"sda5/start", ""},
                 {"sda5/size", "1\n"}, {"sda6/start", "1\n"},    {"sda6/size", ""},
                 {"sda7/size", "1\n"}, {"sda7/start", "none\n"}, {"sda8/start", "1\n"},
                 {"sda8/size", "\n"}};
    for (const auto &file : files) {
        MachineFile(machine, std::string("/sys/block/sda/") + file.szFile, file.szText);
    }
    QuietCall(machine, [] {
        ExpectNoPlace("sda", 1, 0, OLD_CODE);
        ExpectNoPlace("sdb", 1, 0, OLD_CODE);
        ExpectNoPlace("/dev/sda", 128, 0, OLD_CODE);
        ExpectNoPlace("sda", 2, -1, ERR_OPEN_FAILED);
        ExpectNoPlace("sda", 3, -1, ERR_OPEN_FAILED);
        ExpectNoPlace("sda", 5, -1, ERR_READ_FAILED);
        ExpectNoPlace("sda", 6, -1, ERR_READ_FAILED);
        ExpectNoPlace("sda", 7, -1, ERR_READ_FAILED);
        ExpectNoPlace("sda", 8, -1, ERR_READ_FAILED);
    });
}

// The second is not even asked for.
TEST(PartitionStartSize, AsksForTheStartFirst)
{
    MACHINE machine = MachineMake();
    PartitionedDiskAdd(machine, "sda", PLACES_8);
    machine.faults = {{.szFunction = "open", .error = EACCES, .fGoOn = true, .szProcess = "0"}};
    const RUN_RESULT result =
        MachineCall(machine, [] { ExpectNoPlace("sda", 2, -1, ERR_OPEN_FAILED); });
    EXPECT_EQ(TranscriptText(result), "fault open \"1 0 /sys/block/sda/sda2/start\"\n");
}

// ---- the layout of a disk ----------------------------------------------------------------------

void ExpectLayout(int raid, u32 versionExpected)
{
    u32 version = UNTOUCHED;
    const int resultExpected = versionExpected == UNTOUCHED ? 0 : 1;
    EXPECT_EQ(PartitionCheckLayout("/dev/sda", raid, &version), resultExpected);
    EXPECT_EQ(version, versionExpected);
    EXPECT_EQ(PartitionCheckLayout("sda", raid, nullptr), resultExpected);
}

TEST(PartitionCheck, FindsEveryRowByItsFourNumbers)
{
    for (const u32 buildin : {0U, 1U}) {
        MachineCall(MachineWithConf(buildin == 1 ? CONF_BUILDIN : CONF_RAID), [buildin] {
            for (const EXPECTED_ROW &row : ROWS) {
                if (row.buildin != buildin) {
                    continue;
                }
                SCOPED_TRACE(testing::Message() << row.version << " raid " << row.raid);
                DiskRewrite({row.start[0], row.size[0], row.start[1], row.size[1]});
                ExpectLayout(static_cast<int>(row.raid), VersionRead(row));
            }
        });
    }
}

TEST(PartitionCheck, TakesNoNumberThatIsOneOff)
{
    MachineCall(MachineWithConf(CONF_RAID), [] {
        for (const EXPECTED_ROW &row : ROWS) {
            if (row.buildin == 1) {
                continue;
            }
            for (int iNumber = 0; iNumber < 4; iNumber++) {
                for (const int off : {1, -1}) {
                    SCOPED_TRACE(testing::Message() << row.version << ' ' << iNumber << ' ' << off);
                    u64 numbers[] = {row.start[0], row.size[0], row.start[1], row.size[1]};
                    numbers[iNumber] += static_cast<u64>(off);
                    DiskRewrite({numbers[0], numbers[1], numbers[2], numbers[3]});
                    ExpectLayout(static_cast<int>(row.raid), UNTOUCHED);
                }
            }
        }
    });
}

TEST(PartitionCheck, KeepsTheTwoKindsOfMachinesApart)
{
    QuietCall(MachineOfDisks({{"sda", PLACES_3_NO_RAID}}), [] {
        ExpectLayout(0, 3);
        ExpectLayout(1, UNTOUCHED);
        DiskRewrite(PLACES_8);
        ExpectLayout(0, 8);
        ExpectLayout(1, 8);
        DiskRewrite(PLACES_BUILDIN);
        ExpectLayout(0, UNTOUCHED);
        ExpectLayout(1, UNTOUCHED);
    });
}

TEST(PartitionCheck, KnowsOneGeometryAloneWithBuiltInStorage)
{
    MachineCall(MachineOfDisks({{"sda", PLACES_8}}, CONF_BUILDIN), [] {
        ExpectLayout(0, UNTOUCHED);
        ExpectLayout(1, UNTOUCHED);
        DiskRewrite(PLACES_BUILDIN);
        ExpectLayout(0, 7);
        ExpectLayout(1, UNTOUCHED);
    });
}

TEST(PartitionCheck, LooksAtNoFurtherPartition)
{
    MACHINE machine = MachineOfDisks({{"sda", PLACES_7}});
    MachinePartitionAdd(machine, "sda", 3, 1, 1);
    MachinePartitionAdd(machine, "sda", 4, 2, 2);
    MachineCall(machine, [] { ExpectLayout(1, 7); });
}

// Before the partitions: the lookup's code stands, unless a partition's comes behind it.
TEST(PartitionCheck, AsksForTheBuiltInStorageFirst)
{
    MACHINE machine = MachineWithConf("supportraid=yes\n");
    MachineDiskAdd(machine, "sda");
    MachineDiskAdd(machine, "sdb");
    MachineFile(machine, "/sys/block/sdb/sdb1/size", "1\n");
    MachineCall(machine, [] {
        EXPECT_FAILS(PartitionCheckLayout("sda", 1, nullptr), 0, ERR_KEY_NOT_FOUND);
        EXPECT_FAILS(PartitionCheckLayout("sdb", 1, nullptr), 0, ERR_OPEN_FAILED);
        EXPECT_QUIET(PartitionCheckLayout(nullptr, 1, nullptr), 0);
    });
}

struct ABSENT_CASE {
    const char *szDisk;
    DISK_PLACES places;
    const char *szLog;
};

constexpr ABSENT_CASE ABSENT_CASES[] = {
    {"/dev/sda", BLANK, "<15>partition_layout.cpp:# /dev/sda: dont contain partition [1]"},
    {"sda", {2048, 4980480, 0, 0}, "<15>partition_layout.cpp:# sda: dont contain partition [2]"},
    {"/dev/sda",
     {0, 0, 4982528, 4194304},
     "<15>partition_layout.cpp:# /dev/sda: dont contain partition [1]"},
};

TEST(PartitionCheck, TellsWhichPartitionIsNotThere)
{
    const auto check = [](const char *szDisk) {
        u32 version = UNTOUCHED;
        const long long result = PartitionCheckLayout(szDisk, 1, &version);
        EXPECT_EQ(version, UNTOUCHED);
        return result;
    };
    for (const ABSENT_CASE &row : ABSENT_CASES) {
        ExpectCalls({{.szName = row.szLog,
                      .machine = MachineOfDisks({{"sda", row.places}}),
                      .call = [&] { return check(row.szDisk); },
                      .steps = {{row.szLog}}}});
    }
    ExpectCalls(
        {{.szName = "size unread",
          .machine = WithFile(MachineOfDisks({{"sda", PLACES_8}}), "/sys/block/sda/sda2/size", ""),
          .call = [&] { return check("/dev/sda"); },
          .code = ERR_READ_FAILED,
          .steps = {{"<15>partition_layout.cpp:# /dev/sda: dont contain partition [2]"}}},
         {.szName = "no disk", .machine = MachineWithConf(CONF_RAID), .call = [&] {
              return check(nullptr);
          }}});
}

} // namespace
