// SPDX-License-Identifier: MIT
#include "nurostoragecore/raid_info.h"

#include "last_error.h"
#include "steps.h"
#include "streams.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <cstddef>
#include <cstring>
#include <fcntl.h>
#include <fstream>
#include <syslog.h>
#include <unistd.h>

namespace
{

constexpr u64 GIB = 1ULL << 30;

// The order of the fields.
static_assert(offsetof(RAID_REBUILD_STATUS, state) == 0);
static_assert(offsetof(RAID_REBUILD_STATUS, state) < offsetof(RAID_REBUILD_STATUS, done));
static_assert(offsetof(RAID_REBUILD_STATUS, done) < offsetof(RAID_REBUILD_STATUS, total));
static_assert(offsetof(RAID_INFO, nMd) == 0);
static_assert(offsetof(RAID_INFO, nMd) < offsetof(RAID_INFO, szPath));
static_assert(offsetof(RAID_INFO, szPath) < offsetof(RAID_INFO, szUuid));
static_assert(offsetof(RAID_INFO, szUuid) < offsetof(RAID_INFO, level));
static_assert(offsetof(RAID_INFO, level) < offsetof(RAID_INFO, majorVersion));
static_assert(offsetof(RAID_INFO, majorVersion) < offsetof(RAID_INFO, minorVersion));
static_assert(offsetof(RAID_INFO, minorVersion) < offsetof(RAID_INFO, status));
static_assert(offsetof(RAID_INFO, status) < offsetof(RAID_INFO, rebuild));
static_assert(offsetof(RAID_INFO, rebuild) < offsetof(RAID_INFO, arraySize));
static_assert(offsetof(RAID_INFO, arraySize) < offsetof(RAID_INFO, deviceSize));
static_assert(offsetof(RAID_INFO, deviceSize) < offsetof(RAID_INFO, nRaidDisks));
static_assert(offsetof(RAID_INFO, nRaidDisks) < offsetof(RAID_INFO, nActiveDisks));
static_assert(offsetof(RAID_INFO, nActiveDisks) < offsetof(RAID_INFO, nSpareDisks));
static_assert(offsetof(RAID_INFO, nSpareDisks) < offsetof(RAID_INFO, pDisks));
static_assert(sizeof(RAID_INFO::szPath) == 128 && sizeof(RAID_INFO::szUuid) == 64);

MACHINE ArrayMake(const MACHINE_MD &md)
{
    MACHINE machine = MachineMake();
    MachineMdAdd(machine, md);
    return machine;
}

std::string Told(const std::string &szWhat, const std::string &szError)
{
    return "<15>raid_info.cpp:# Failed to " + szWhat + ", errno=" + szError + "\n";
}

// The query fails with this code and these lines, hands nothing out and leaves nothing open.
void ExpectQueryFails(const MACHINE &machine, const char *szPath, u32 code,
                      const std::string &szLog)
{
    const RUN_RESULT result = MachineCall(machine, [&] {
        RAID_INFO before = {};
        RAID_INFO *pInfo = &before;
        openlog(nullptr, LOG_NDELAY, LOG_USER); // the log's own descriptor is none of the query's
        const int nOpen = DescriptorsCount();
        EXPECT_FAILS(RAIDInfoGet(szPath, &pInfo), -1, code);
        EXPECT_EQ(DescriptorsCount(), nOpen);
        EXPECT_EQ(pInfo, &before);
    });
    EXPECT_EQ(LogText(result), szLog);
}

// For the command, an array that cannot be queried is one that is not there.
void ExpectNotFound(const MACHINE &machine, u32 code, const std::string &szLog)
{
    SCOPED_TRACE(szLog);
    ExpectQueryFails(machine, "/dev/md2", code, szLog);
    const RUN_RESULT result = RunEnds(machine, {"status", "2"}, 1, "RAID /dev/md2 is not found\n");
    EXPECT_EQ(LogText(result), szLog);
}

// An array md2 with these answers.
void ExpectNotFound(MACHINE_MD md, u32 code, const std::string &szLog)
{
    md.nMd = 2;
    ExpectNotFound(ArrayMake(md), code, szLog);
}

// Queries the path and lets the body look at the record.
RUN_RESULT WithInfo(const MACHINE &machine, const std::string &szPath,
                    const std::function<void(const RAID_INFO &)> &body)
{
    return MachineCall(machine, [&] {
        RAID_INFO *pInfo = nullptr;
        openlog(nullptr, LOG_NDELAY, LOG_USER);
        const int nOpen = DescriptorsCount();
        EXPECT_QUIET(RAIDInfoGet(szPath.c_str(), &pInfo), 1);
        EXPECT_EQ(DescriptorsCount(), nOpen);
        ASSERT_NE(pInfo, nullptr);
        body(*pInfo);
        RAIDInfoFree(pInfo);
    });
}
RUN_RESULT WithInfo(const MACHINE_MD &md, const std::function<void(const RAID_INFO &)> &body)
{
    return WithInfo(ArrayMake(md), "/dev/md" + std::to_string(md.nMd), body);
}

// One request on the array's node, by itself.
RUN_RESULT WithArray(const MACHINE_MD &md, const std::function<void(int fd)> &body)
{
    return MachineCall(ArrayMake(md), [&] {
        const int fd = open(("/dev/md" + std::to_string(md.nMd)).c_str(), O_RDONLY);
        ASSERT_GE(fd, 0);
        RecordReset();
        body(fd);
        close(fd);
    });
}

} // namespace

// ---- the record --------------------------------------------------------------------------------

TEST(RaidInfo, ARunningMirrorOfTwo)
{
    WithInfo({.nMd = 2,
              .majorVersion = 1,
              .minorVersion = 2,
              .level = 1,
              .size = 1048576,
              .nRaidDisks = 2,
              .nActiveDisks = 1,
              .nSpareDisks = 3,
              .arraySize = GIB,
              .members = {{"sda3", "in_sync\n", "0\n"}, {"sdb3", "spare\n", "1\n"}}},
             [](const RAID_INFO &info) {
                 EXPECT_EQ(info.nMd, 2);
                 EXPECT_STREQ(info.szPath, "/dev/md2");
                 EXPECT_STREQ(info.szUuid, "");
                 EXPECT_EQ(info.level, 2U);
                 EXPECT_EQ(info.majorVersion, 1);
                 EXPECT_EQ(info.minorVersion, 2);
                 EXPECT_EQ(info.status, 1U);
                 EXPECT_EQ(info.rebuild.state, 0U);
                 EXPECT_EQ(info.rebuild.done, 0U);
                 EXPECT_EQ(info.rebuild.total, 0U);
                 EXPECT_EQ(info.arraySize, GIB);
                 EXPECT_EQ(info.deviceSize, GIB);
                 EXPECT_EQ(info.nRaidDisks, 2);
                 EXPECT_EQ(info.nActiveDisks, 1);
                 EXPECT_EQ(info.nSpareDisks, 3);
                 ASSERT_NE(info.pDisks, nullptr);
                 EXPECT_STREQ(info.pDisks->szPath, "/dev/sdb3");
                 EXPECT_EQ(info.pDisks->state, 8U);
                 EXPECT_EQ(info.pDisks->slot, 1);
                 ASSERT_NE(info.pDisks->pNext, nullptr);
                 EXPECT_STREQ(info.pDisks->pNext->szPath, "/dev/sda3");
                 EXPECT_EQ(info.pDisks->pNext->pNext, nullptr);
             });
}

TEST(RaidInfo, AnArrayWithoutMembersHasNoList)
{
    WithInfo({.nMd = 0}, [](const RAID_INFO &info) { EXPECT_EQ(info.pDisks, nullptr); });
}

TEST(RaidInfo, EveryLevelIsOneBit)
{
    const struct {
        int level;
        u32 code;
    } levels[] = {{0, 1}, {1, 2}, {5, 4}, {6, 8}, {10, 16}, {-1, 32}};
    for (const auto &level : levels) {
        WithInfo({.nMd = 2, .level = level.level},
                 [&](const RAID_INFO &info) { EXPECT_EQ(info.level, level.code); });
    }
}

TEST(RaidInfo, AnUnsupportedLevelIsOnlyLogged)
{
    const RUN_RESULT result = WithInfo({.nMd = 2, .level = 4}, [](const RAID_INFO &info) {
        EXPECT_EQ(info.level, 0U);
        EXPECT_EQ(info.deviceSize, GIB);
    });
    EXPECT_EQ(LogText(result), "<15>raid_info.cpp:# Not supported RAID level: 4\n");
}

struct PATH_CASE {
    const char *szName;
    std::string szPath; // leads to md2
    std::string szRecorded;
};

TEST(RaidInfo, ThePathIsTakenAsItIsAndRecordedUpTo127Characters)
{
    // Through folders that lead back, so that it is the whole path that is opened.
    std::string szLong = "/dev/md2";
    while (szLong.size() < 150) {
        szLong += "x/../md2";
    }
    const std::string szZeros = "/dev/md" + std::string(130, '0');
    MACHINE machine = ArrayMake({.nMd = 2, .members = {{"sda3"}}});
    MachineLink(machine, "/dev/md2p1", "md2");
    MachineLink(machine, szZeros + "2", "/dev/md2");
    MachineFolder(machine, "/dev/md2x");
    for (const PATH_CASE &row : {
             PATH_CASE{"it may go on behind the number", "/dev/md2p1", "/dev/md2p1"},
             {"a long one is cut", szLong, szLong.substr(0, 127)},
             // Cut to what the record holds, it would be the path of md0.
             {"members are those of the whole path", szZeros + "2", szZeros.substr(0, 127)},
         }) {
        SCOPED_TRACE(row.szName);
        WithInfo(machine, row.szPath, [&row](const RAID_INFO &info) {
            EXPECT_EQ(info.nMd, 2);
            EXPECT_EQ(info.szPath, row.szRecorded);
            ASSERT_NE(info.pDisks, nullptr);
            EXPECT_STREQ(info.pDisks->szPath, "/dev/sda3");
        });
    }
}

// A folder opens for reading alone.
TEST(RaidInfo, TheNodeIsOpenedForReading)
{
    MACHINE machine = Without(ArrayMake({.nMd = 2}), "/dev/md2");
    MachineFolder(machine, "/dev/md2");
    const RUN_RESULT result = WithInfo(
        machine, "/dev/md2", [](const RAID_INFO &info) { EXPECT_EQ(info.arraySize, GIB); });
    EXPECT_EQ(LogText(result), "");
}
TEST(RaidInfo, FreeingNothingIsAllowed)
{
    MachineCall(MachineMake(), [] {
        RecordReset();
        RAIDInfoFree(nullptr);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
}

// ---- device size -------------------------------------------------------------------------------

struct DEVICE_SIZE_CASE {
    const char *szWhat;
    MACHINE_MD md;
    u64 cb;
    const char *szFile = "5000\n";
};

TEST(RaidInfo, TheDeviceSizeHasItsSources)
{
    constexpr u64 OF_FIELD = 1024000;
    constexpr u64 OF_FILE = 5120000;
    const DEVICE_SIZE_CASE cases[] = {
        {"0.90 takes the field", {.majorVersion = 0, .size = 1000}, OF_FIELD},
        {"above 4 GiB too", {.majorVersion = 0, .size = 1000, .arraySize = 5 * GIB}, OF_FIELD},
        {"0.90 takes a field of 0", {.majorVersion = 0, .size = 0}, 0},
        {"0.90 extends the sign", {.majorVersion = 0, .size = -1}, UINT64_MAX - 1023},
        {"1.x takes the field of a small array", {.size = 1000, .arraySize = GIB}, OF_FIELD},
        {"the last size that is small", {.size = 1000, .arraySize = 0xFFFFFFFE}, OF_FIELD},
        {"the first size that is not", {.size = 1000, .arraySize = 0xFFFFFFFF}, OF_FILE},
        {"1.x, 4 GiB", {.size = 1000, .arraySize = 4 * GIB}, OF_FILE},
        {"a high word and nothing below", {.size = 1000, .arraySize = 64 * GIB}, OF_FILE},
        {"1.x, a field of 0", {.size = 0, .arraySize = GIB}, OF_FILE},
        {"beyond 2 TiB", {.size = 0, .arraySize = GIB << 13}, GIB << 13, "8589934592\n"},
        {"1.x without the file", {.size = 0}, 0, NO_FILE},
        {"any version but 0 is 1.x", {.majorVersion = 2, .size = 0}, 7168, "7\n"},
        {"negative ones too", {.majorVersion = -1, .size = 0}, 7168, "7\n"},
        {"RAID 0 has none", {.level = 0, .size = 1000}, 0},
        {"linear has none", {.level = -1, .size = 1000}, 0},
        {"none from the file", {.level = 0, .size = 0, .arraySize = 8 * GIB}, 0},
        {"RAID 10 has one", {.level = 10, .size = 1000}, OF_FIELD},
    };
    for (const DEVICE_SIZE_CASE &row : cases) {
        SCOPED_TRACE(row.szWhat);
        MACHINE_MD md = row.md;
        md.szComponentSize = row.szFile;
        WithInfo(md, [&](const RAID_INFO &info) {
            EXPECT_EQ(info.deviceSize, row.cb);
            EXPECT_EQ(info.arraySize, row.md.arraySize);
        });
    }
}
struct COMPONENT_CASE {
    std::string szText;
    u64 nSector;
};

TEST(ComponentSize, TheFileIsANumberOfKib)
{
    const std::string szZeros(49, '0');
    const COMPONENT_CASE cases[] = {
        {"1048576\n", 2097152},
        {"1048576", 2097152},
        {"0\n", 0},
        {"", 0},
        {"\n", 0},
        {"none\n", 0},
        {"12abc\n", 24},
        {"8589934592\n", 17179869184},
        {szZeros.substr(0, 47) + "7\n", 14}, // 49 bytes are still read
        {szZeros.substr(0, 48) + "7", 14},   // without a line end too
        {szZeros.substr(0, 48) + "7\n", 0},  // 50 are not
        {std::string(100, '0') + "7\n", 0},  // nor are more
        {"7\n" + std::string(60, ' '), 0},
    };
    for (const COMPONENT_CASE &one : cases) {
        SCOPED_TRACE(one.szText);
        const RUN_RESULT result = WithArray({.nMd = 2, .szComponentSize = one.szText}, [&](int fd) {
            EXPECT_EQ(RAIDComponentSizeGet(fd), one.nSector);
            EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
        });
        EXPECT_EQ(LogText(result), "");
    }
}

u64 ComponentSizeOfMd9()
{
    const int fd = open("/dev/md9", O_RDONLY);
    const u64 nSector = RAIDComponentSizeGet(fd);
    close(fd);
    return nSector;
}

TEST(ComponentSize, WhatCannotBeReadIsNothing)
{
    MACHINE machine = ArrayMake({.nMd = 9, .szComponentSize = NO_FILE});
    MachineCall(machine, [] {
        EXPECT_EQ(ComponentSizeOfMd9(), 0U);
        EXPECT_EQ(RAIDComponentSizeGet(-1), 0U);
    });
    MachineFolder(machine, "/sys/block/md9/md/component_size");
    MachineCall(machine, [] { EXPECT_EQ(ComponentSizeOfMd9(), 0U); });
}
TEST(ComponentSize, TheMinorNumberNamesTheArray)
{
    MACHINE machine = ArrayMake({.nMd = 9, .szComponentSize = "1\n", .deviceMinor = 300});
    MachineFile(machine, "/sys/block/md300/md/component_size", "21\n");
    MachineCall(machine, [] { EXPECT_EQ(ComponentSizeOfMd9(), 42U); });
}

// ---- the partitionable driver ------------------------------------------------------------------

constexpr u64 PLAIN = 2;         // of /sys/block/md130
constexpr u64 PARTITIONABLE = 4; // of /sys/block/md_d2

// A device of major 254, minor 130: md_d2 when /proc/devices makes 254 the partitionable driver.
MACHINE PartitionableMake(const std::string &szDevices)
{
    MACHINE machine = ArrayMake({.nMd = 9, .deviceMajor = 254, .deviceMinor = 130});
    MachineFile(machine, "/sys/block/md130/md/component_size", "1\n");
    MachineFile(machine, "/sys/block/md_d2/md/component_size", "2\n");
    MachineFile(machine, "/proc/devices", szDevices);
    return machine;
}
struct DEVICES_CASE {
    const char *szWhat;
    std::string szDevices;
    u64 nSector;
};

void ExpectDevicesRead(const std::vector<DEVICES_CASE> &cases)
{
    for (const DEVICES_CASE &row : cases) {
        SCOPED_TRACE(row.szWhat);
        MachineCall(PartitionableMake(row.szDevices),
                    [&] { EXPECT_EQ(ComponentSizeOfMd9(), row.nSector); });
    }
}

TEST(ComponentSize, TheDriverStandsInTheBlockSection)
{
    ExpectDevicesRead({
        {"a plain list", "Character devices:\n  1 mem\n\nBlock devices:\n  9 md\n254 mdp\n",
         PARTITIONABLE},
        {"another number", "Block devices:\n253 mdp\n", PLAIN},
        {"no such driver", "Block devices:\n254 device-mapper\n", PLAIN},
        {"in the character section only", "Character devices:\n254 mdp\nBlock devices:\n  9 md\n",
         PLAIN},
        {"before any section", "254 mdp\nBlock devices:\n", PLAIN},
        {"a longer name", "Block devices:\n254 mdp2\n", PLAIN},
        {"a shorter name", "Block devices:\n254 md\n", PLAIN},
        {"another case", "Block devices:\n254 MDP\n", PLAIN},
        {"a heading in another case", "block devices:\n254 mdp\n", PLAIN},
        {"words between the headings", "Block more devices:\n254 mdp\n", PLAIN},
        {"a heading over two lines", "Block\n\n  devices:\n254 mdp\n", PARTITIONABLE},
        {"tabs", "Block\tdevices:\n\t254\tmdp\n", PARTITIONABLE},
        {"a number on an earlier line", "Block devices:\n254\n\n\nmdp\n", PARTITIONABLE},
        {"the last number counts", "Block devices:\n253 254 mdp\n", PARTITIONABLE},
        {"one that begins with a 9, too", "Block devices:\n254 9 mdp\n", PLAIN},
        {"or with a 0", "Block devices:\n254 0 mdp\n", PLAIN},
        {"words between keep the number", "Block devices:\n254 sd mdp\n", PARTITIONABLE},
        {"a number from the other section", "254 mem\nBlock devices:\nmdp\n", PARTITIONABLE},
        {"a number with text behind it", "Block devices:\n254abc mdp\n", PARTITIONABLE},
        {"no line end", "Block devices:\n254 mdp", PARTITIONABLE},
        {"an empty file", "", PLAIN},
    });
}

TEST(ComponentSize, WordsAreReadWithCommentsAndQuotes)
{
    ExpectDevicesRead({
        {"a comment to the end of the line", "Block devices:\n# 254 mdp\n", PLAIN},
        {"a comment behind words", "Block devices: # 253 mdp\n254 mdp\n", PARTITIONABLE},
        {"a comment without a line end", "Block devices:\n253 mdp2 #", PLAIN},
        {"double quotes are dropped", "\"Block\" \"devices:\"\n254 \"mdp\"\n", PARTITIONABLE},
        {"single quotes are dropped", "'Block' 'devices:'\n254 'mdp'\n", PARTITIONABLE},
        {"quotes within a word", "Bl\"oc\"k devices:\n254 m'd'p\n", PARTITIONABLE},
        {"quotes group blanks", "\"Block devices:\"\n254 mdp\n", PLAIN},
        {"a quoted comment mark is none", "Block devices:\n'#' 254 mdp\n", PARTITIONABLE},
        {"one quote in the other", "Block devices:\n\"'\" 254 mdp '\"'\n", PARTITIONABLE},
        {"an odd quote ends with its line", "Block devices:\n253 o'x\n254 mdp\n", PARTITIONABLE},
        {"an odd double quote, too", "Block devices:\n253 \"x\n254 mdp\n255 y\"\n", PARTITIONABLE},
    });
}

TEST(ComponentSize, WordsMayBeLong)
{
    for (const size_t cb : {98U, 99U, 100U, 101U, 102U, 199U, 200U, 201U, 1000U, 5000U}) {
        const std::string szLong(cb, 'x');
        ExpectDevicesRead({
            {"between", "Block devices:\n254 " + szLong + " mdp\n", PARTITIONABLE},
            {"at the end", "Block devices:\n254 " + szLong, PLAIN},
            {"ends like the name", "Block devices:\n254 " + szLong + "mdp\n", PLAIN},
        });
    }
}

TEST(ComponentSize, TheFixUpsOfTheWordReaderHarmNothing)
{
    ExpectDevicesRead({
        {"a bracket behind active", "Block devices:\n254 md0 active(auto-read-only) mdp\n",
         PARTITIONABLE},
        {"a bracket behind a word that ends in it", "Block devices:\n254 inactive(x mdp\n",
         PARTITIONABLE},
        {"the word without its first bracket", "Block devices:\n254 auto-read-only) mdp\n",
         PARTITIONABLE},
        {"a bracket elsewhere", "Block devices:\n254 md(p mdp\n", PARTITIONABLE},
        {"the bracket is a separator", "Block devices:\n254 active(mdp\n", PARTITIONABLE},
        {"no other bracket is", "Block devices:\n254 act(mdp\n", PLAIN},
        {"the bracket ends the word", "Block devices:\n253 254active(mdp mdp\n", PARTITIONABLE},
    });
}

TEST(ComponentSize, WithoutAListThereIsNoSuchDriver)
{
    QuietCall(Without(PartitionableMake(""), "/proc/devices"),
              [] { EXPECT_QUIET(ComponentSizeOfMd9(), PLAIN); });
}

// Without memory for a word the kernel's list names no driver, so the array is not partitionable.
TEST(ComponentSize, WithoutMemoryNoDriverIsKnown)
{
    const MACHINE machine = PartitionableMake("Block devices:\n254 mdp\n");
    MachineCall(machine, [] { EXPECT_EQ(ComponentSizeOfMd9(), PARTITIONABLE); });
    MachineCall(WithFault(machine, {.szFunction = "realloc"}),
                [] { EXPECT_EQ(ComponentSizeOfMd9(), PLAIN); });
}

TEST(ComponentSize, TheDriverIsLookedUpUntilItIsFound)
{
    MachineCall(PartitionableMake("Block devices:\n"), [] {
        EXPECT_EQ(ComponentSizeOfMd9(), PLAIN);
        std::ofstream("/proc/devices") << "Block devices:\n254 mdp\n";
        EXPECT_EQ(ComponentSizeOfMd9(), PARTITIONABLE);
        std::ofstream("/proc/devices") << "Block devices:\n253 mdp\n";
        EXPECT_EQ(ComponentSizeOfMd9(), PARTITIONABLE);
    });
}

TEST(ComponentSize, TheMinorIsSharedByTheArraysPartitions)
{
    for (const unsigned int deviceMinor : {0U, 63U}) {
        const MACHINE array = ArrayMake({.nMd = 9, .deviceMajor = 254, .deviceMinor = deviceMinor});
        MachineCall(WithFile(array, "/sys/block/md_d0/md/component_size", "2\n"),
                    [] { EXPECT_EQ(ComponentSizeOfMd9(), PARTITIONABLE); });
    }
}

// ---- failures of the query ---------------------------------------------------------------------

TEST(RaidInfoFailure, NullIsABadParameter)
{
    QuietCall(ArrayMake({.nMd = 2}), [] {
        RAID_INFO *pInfo = nullptr;
        EXPECT_FAILS(RAIDInfoGet(nullptr, &pInfo), -1, 0x0D00U);
        EXPECT_EQ(pInfo, nullptr);
        EXPECT_FAILS(RAIDInfoGet("/dev/md2", nullptr), -1, 0x0D00U);
    });
}

TEST(RaidInfoFailure, AnotherPathIsRefusedBeforeItIsOpened)
{
    for (const char *const szPath : {"/dev/sda", "/dev/md", "/dev/mdx", "/dev/md_d2", "md2",
                                     "/dev//md2", "/DEV/md2", "", " /dev/md2", "/dev/m2"}) {
        // Would be logged as another failure if it came so far.
        ExpectQueryFails(WithFault(ArrayMake({.nMd = 2}), {.szFunction = "open"}), szPath, 0xBE00,
                         std::string("<15>raid_info.cpp:# invalide path ") + szPath +
                             ", errno=Success\n");
    }
}

TEST(RaidInfoFailure, WithoutMemory)
{
    const MACHINE machine = ArrayMake({.nMd = 2});
    ExpectNotFound(WithFault(machine, {.szFunction = "calloc"}), 0x0200,
                   Told("calloc", "Cannot allocate memory"));
}

TEST(RaidInfoFailure, ANodeThatDoesNotOpen)
{
    ExpectNotFound(MachineMake(), 0x0900, Told("open /dev/md2", "No such file or directory"));
}

constexpr char STATUS[] = "ioctl for raid status";
constexpr char SIZE[] = "ioctl for raid size";
constexpr char SYNC[] = "ioctl for sync status";
constexpr char DISKS[] = "get disk list for /dev/md2";

// The absence is overwritten on its way up, so an inactive array is a failure like any other.
TEST(RaidInfoFailure, TheArrayInformation)
{
    ExpectNotFound({.errnoInfo = EIO}, 0x8000,
                   Told(STATUS, "Input/output error") + Told(STATUS, "0X8000"));
    ExpectNotFound({.errnoInfo = ENODEV}, 0x8000,
                   Told(STATUS, "No such device") + Told(STATUS, "0X8000"));
    ExpectNotFound({.errnoInfo = EINTR}, 0xA700, Told(STATUS, "0XA700"));
}

TEST(RaidInfoFailure, TheSize)
{
    ExpectNotFound({.errnoSize = EIO}, 0x8000,
                   Told(STATUS, "Input/output error") + Told(SIZE, "0X8000"));
    ExpectNotFound({.errnoSize = ENODEV}, 0x0600, Told(SIZE, "0X600"));
}

TEST(RaidInfoFailure, TheMemberList)
{
    const MACHINE machine = ArrayMake({.nMd = 2, .members = {{"sda3"}}});
    ExpectNotFound(WithFault(machine, {.szFunction = "glob", .error = EIO}), 0x8000,
                   "<15>raid_disk.cpp:# failed to glob '/sys/block/md2/md/dev-*', "
                   "errno=Input/output error\n" +
                       Told(DISKS, "0X8000"));
}

TEST(RaidInfoFailure, TheResync)
{
    ExpectNotFound({.errnoSync = EIO, .members = {{"sda3"}}}, 0x8000,
                   Told(SYNC, "Input/output error") + Told(DISKS, "0X8000"));
    ExpectNotFound({.errnoSync = ENOTTY}, 0x8000,
                   Told(SYNC, "Inappropriate ioctl for device") + Told(DISKS, "0X8000"));
    ExpectNotFound({.errnoSync = ENODEV, .members = {{"sda3"}}}, 0x0600, Told(DISKS, "0X600"));
}

TEST(RaidInfoFailure, TheHealth)
{
    ExpectNotFound({.errnoHealth = EIO, .members = {{"sda3"}}}, 0x8000,
                   Told(STATUS, "Input/output error") + Told(SIZE, "0X8000"));
    ExpectNotFound({.errnoHealth = ENOTTY}, 0x8000,
                   Told(STATUS, "Inappropriate ioctl for device") + Told(SIZE, "0X8000"));
    ExpectNotFound({.errnoHealth = ENODEV}, 0x0600, Told(SIZE, "0X600"));
    ExpectNotFound({.errnoHealth = EINTR}, 0xA700, Told(SIZE, "0XA700"));
    for (const int health : {3, -1, 255}) {
        ExpectNotFound({.health = health, .members = {{"sda3"}}}, 0x8000,
                       "<15>raid_info.cpp:# unknown raid status, status=" + std::to_string(health) +
                           "\n" + Told(SIZE, "0X8000"));
    }
}

// Of two steps that fail the first one alone is told.
TEST(RaidInfoFailure, TheStepsHaveAnOrder)
{
    ExpectNotFound({.level = 4, .errnoSize = ENODEV}, 0x0600,
                   "<15>raid_info.cpp:# Not supported RAID level: 4\n" + Told(SIZE, "0X600"));
    ExpectNotFound({.level = 4, .errnoInfo = EINTR, .errnoSize = ENODEV}, 0xA700,
                   Told(STATUS, "0XA700"));

    const std::string szMember =
        "<15>raid_disk.cpp:# Failed to get disk slot, errno=Success\n"
        "<15>raid_disk.cpp:# Failed to get slot of /sys/block/md2/md/dev-sda3, errno=0XA00\n"
        "<15>raid_disk.cpp:# Failed to create disk info from /sys/block/md2/md/dev-sda3 "
        ",errno=0XA00\n";
    const std::vector<MACHINE_MEMBER> members = {{"sda3", "in_sync\n", ""}};
    ExpectNotFound({.errnoSize = ENODEV, .errnoSync = EIO, .members = members}, 0x0600,
                   Told(SIZE, "0X600"));
    ExpectNotFound({.errnoSync = ENODEV, .members = members}, 0x0600,
                   szMember + Told(DISKS, "0X600"));
    ExpectNotFound({.errnoHealth = ENODEV, .members = members}, 0x0600,
                   szMember + Told(SIZE, "0X600"));
    ExpectNotFound({.errnoHealth = EINTR, .errnoSync = ENODEV}, 0x0600, Told(DISKS, "0X600"));
}

// ---- the requests by themselves ----------------------------------------------------------------

TEST(RaidRequest, NullIsABadParameter)
{
    const RUN_RESULT result = WithArray({.nMd = 2}, [](int fd) {
        RAID_REBUILD_STATUS rebuild = {};
        EXPECT_FAILS(RAIDIoctlInfo(fd, nullptr), -1, 0x0D00U);
        EXPECT_FAILS(RAIDIoctlSize(fd, nullptr), -1, 0x0D00U);
        EXPECT_FAILS(RAIDIoctlStatus(fd, nullptr), -1, 0x0D00U);
        EXPECT_FAILS(RAIDRebuildStatusGet(fd, nullptr), -1, 0x0D00U);
        EXPECT_FAILS(RAIDRebuildStatusGet(-1, &rebuild), -1, 0x0D00U);
    });
    EXPECT_EQ(LogText(result), "");
}

TEST(RaidRequest, NoDescriptorIsTooLow)
{
    MachineCall(ArrayMake({.nMd = 2}), [] {
        RAID_REBUILD_STATUS rebuild = {};
        ASSERT_EQ(close(STDIN_FILENO), 0);
        ASSERT_EQ(open("/dev/md2", O_RDONLY), STDIN_FILENO);
        EXPECT_EQ(RAIDRebuildStatusGet(STDIN_FILENO, &rebuild), 0);
    });
}

TEST(RaidRequest, TheArrayInformationIsTheDriversRecord)
{
    WithArray({.nMd = 2, .level = 6, .size = 77, .nRaidDisks = 5, .nSpareDisks = 1}, [](int fd) {
        mdu_array_info_t array;
        memset(&array, 0xFF, sizeof(array));
        EXPECT_EQ(RAIDIoctlInfo(fd, &array), 0);
        EXPECT_EQ(array.major_version, 1);
        EXPECT_EQ(array.minor_version, 2);
        EXPECT_EQ(array.level, 6);
        EXPECT_EQ(array.size, 77);
        EXPECT_EQ(array.raid_disks, 5);
        EXPECT_EQ(array.spare_disks, 1);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
}

struct REQUEST_FAILURE_CASE {
    MACHINE_MD md;
    long long (*pAsk)(int fd);
    u32 code;
    std::string szLog = "";
};

long long InfoAsk(int fd)
{
    mdu_array_info_t array = {};
    return RAIDIoctlInfo(fd, &array);
}

long long SizeAsk(int fd)
{
    u64 cb = 99;
    const int result = RAIDIoctlSize(fd, &cb);
    EXPECT_EQ(cb, 0U); // written first
    return result;
}

long long HealthAsk(int fd)
{
    u32 status = 99;
    return RAIDIoctlStatus(fd, &status);
}

long long ResyncAsk(int fd)
{
    RAID_REBUILD_STATUS rebuild = {97, 98, 99};
    const int result = RAIDRebuildStatusGet(fd, &rebuild);
    EXPECT_EQ(rebuild.state, 97U);
    EXPECT_EQ(rebuild.done, 98U);
    EXPECT_EQ(rebuild.total, 99U);
    return result;
}

TEST(RaidRequest, FailsWithItsOwnCodeOrTheCallsOwn)
{
    const REQUEST_FAILURE_CASE cases[] = {
        {{.errnoInfo = EINTR}, InfoAsk, 0xA700},
        {{.errnoInfo = ENODEV}, InfoAsk, 0x8000, Told(STATUS, "No such device")},
        {{.errnoInfo = EFAULT}, InfoAsk, 0x8000, Told(STATUS, "Bad address")},
        {{.errnoSize = ENODEV}, SizeAsk, 0x0600},
        {{.errnoSize = EINTR}, SizeAsk, 0x8000, Told(STATUS, "Interrupted system call")},
        {{.errnoSize = EIO}, SizeAsk, 0x8000, Told(STATUS, "Input/output error")},
        {{.errnoHealth = ENODEV}, HealthAsk, 0x0600},
        {{.errnoHealth = EINTR}, HealthAsk, 0xA700},
        {{.errnoHealth = ENOTTY},
         HealthAsk,
         0x8000,
         Told(STATUS, "Inappropriate ioctl for device")},
        {{.errnoSync = ENODEV}, ResyncAsk, 0x0600},
        {{.errnoSync = EINTR}, ResyncAsk, 0x8000, Told(SYNC, "Interrupted system call")},
        {{.errnoSync = ENOTTY}, ResyncAsk, 0x8000, Told(SYNC, "Inappropriate ioctl for device")},
    };
    for (const REQUEST_FAILURE_CASE &row : cases) {
        SCOPED_TRACE(testing::Message() << "row " << &row - cases);
        const RUN_RESULT result =
            WithArray(row.md, [&row](int fd) { EXPECT_FAILS(row.pAsk(fd), -1, row.code); });
        EXPECT_EQ(LogText(result), row.szLog);
    }
}

TEST(RaidRequest, TheHealthIsMapped)
{
    for (const int health : {0, 1, 2}) {
        WithArray({.nMd = 2, .health = health}, [&](int fd) {
            u32 status = 99;
            EXPECT_EQ(RAIDIoctlStatus(fd, &status), 0);
            EXPECT_EQ(status, 1U << health);
        });
    }
    for (const int health : {3, 4, -1}) {
        const RUN_RESULT result = WithArray({.nMd = 2, .health = health}, [&](int fd) {
            u32 status = 99;
            EXPECT_FAILS(RAIDIoctlStatus(fd, &status), -1, 0x8000U);
        });
        EXPECT_EQ(LogText(result), "<15>raid_info.cpp:# unknown raid status, status=" +
                                       std::to_string(health) + "\n");
    }
}

struct RESYNC_CASE {
    u64 activity;
    u64 done;
    u64 total;
    RAID_REBUILD_STATUS rebuild;
};

TEST(RaidRequest, TheResyncIsToldApart)
{
    for (const RESYNC_CASE &one : {
             RESYNC_CASE{0, 0, 0, {0, 0, 0}},
             {0, 5, 9, {0, 0, 0}},
             {1, 0, 9, {2, 0, 9}},
             {1, 5, 9, {1, 5, 9}},
             {1, 1ULL << 32, 1ULL << 40, {1, 1ULL << 32, 1ULL << 40}},
             {1ULL << 32, 1, 2, {1, 1, 2}},
         }) {
        WithArray({.nMd = 2, .activity = one.activity, .done = one.done, .total = one.total},
                  [&](int fd) {
                      RAID_REBUILD_STATUS rebuild = {99, 99, 99};
                      EXPECT_EQ(RAIDRebuildStatusGet(fd, &rebuild), 0);
                      EXPECT_EQ(rebuild.state, one.rebuild.state);
                      EXPECT_EQ(rebuild.done, one.rebuild.done);
                      EXPECT_EQ(rebuild.total, one.rebuild.total);
                  });
    }
}
