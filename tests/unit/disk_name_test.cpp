// SPDX-License-Identifier: MIT
#include "hwcontrol/disk_name.h"

#include "last_error.h"

#include <array>
#include <climits>
#include <cstring>
#include <string>
#include <utility>

namespace
{

constexpr char UNTOUCHED = '~';

// A buffer of which the callee is told the first cb bytes only.
struct GUARDED_BUFFER {
    std::array<char, 128> text;
    size_t cb;

    explicit GUARDED_BUFFER(size_t cbTold) : text{}, cb(cbTold)
    {
        text.fill(UNTOUCHED);
    }
};

std::string TextOf(const GUARDED_BUFFER &buffer)
{
    return {buffer.text.data(), strnlen(buffer.text.data(), buffer.text.size())};
}

// Nothing behind the bytes that the callee was told of has changed.
bool IsRestKept(const GUARDED_BUFFER &buffer)
{
    const std::string rest(buffer.text.data() + buffer.cb, buffer.text.size() - buffer.cb);
    return rest.find_first_not_of(UNTOUCHED) == std::string::npos;
}

std::string Letters(size_t n)
{
    std::string name = "sd";
    name.append(n - name.size(), 'x');
    return name;
}

// What a call leaves of the record and of the bytes that it is not told of: nothing has changed.
template <typename CALL>
std::pair<int, std::string> ResultAndText(size_t cb, CALL call)
{
    GUARDED_BUFFER out(cb);
    RecordReset();
    const int result = call(out.text.data());
    EXPECT_TRUE(IsRestKept(out));
    EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    return {result, TextOf(out)};
}

using TOLD = std::pair<int, std::string>;

TOLD NumberGet(const std::string &name, size_t cb = 32)
{
    return ResultAndText(cb, [&](char *szDisk) {
        return DiskPartitionNumGet(name.c_str(), szDisk, static_cast<int>(cb));
    });
}

TOLD NumberRemove(const std::string &part, size_t cb = 32)
{
    return ResultAndText(cb, [&](char *szDisk) {
        return DiskPartitionNumRemove(part.c_str(), szDisk, static_cast<int>(cb));
    });
}

TOLD NameGet(const std::string &disk, int partNum, size_t cb = 64)
{
    return ResultAndText(cb, [&](char *szName) {
        return DiskDevicePartitionNameGet(disk.c_str(), partNum, szName, cb);
    });
}

TOLD PathGet(const std::string &disk, int partNum, size_t cb = 64)
{
    return ResultAndText(cb, [&](char *szPath) {
        return DiskDevicePartitionPathGet(disk.c_str(), partNum, szPath, cb);
    });
}

struct INDEX_CASE {
    const char *szName;
    int index;
};

constexpr INDEX_CASE INDEX_CASES[] = {
    {"a", 0},
    {"z", 25},
    {"aa", 26},
    {"az", 51},
    {"ba", 52},
    {"sda", 0},
    {"sdz", 25},
    {"sdaa", 26},
    {"sdaf", 31},
    {"sdag", 32},
    {"sdga", 182},
    {"sdzz", 701},
    {"sdaaa", 702},
    {"/dev/sda", 0},
    {"/dev/sdz", 25},
    {"/dev/sdaa", 26},
    {"/dev/sdb3", 1},
    {"sda1", 0},
    {"sdc12", 2},
    {"sd1a", -1},
    {"sdA", -1},
    {"sdaB", 0},
    {"sda b", 0},
    {"sd", -1},
    {"sd1", -1},
    {"", -1},
    {"/dev/", -1},
    {"/dev/sd", -1},
    {"/dev", -1},
    {"/devsda", -1},        // without its slash it is no prefix, and '/' is no letter
    {"dev/sda", 2855},      // d e v: ((3 + 1)·26 + 4 + 1)·26 + 21
    {"/dev/dev/sda", 2855}, // one prefix goes, not two
    {"sdsda", 12948},       // s d a: ((18 + 1)·26 + 3 + 1)·26 + 0
    {"isdb", 171133},       // i s d b: (((8 + 1)·26 + 18 + 1)·26 + 3 + 1)·26 + 1
    {"/dev/isda1", 171132},
    {"mmcblk0", 160452978},    // m m c b l k: 12 12 2 1 11 10
    {"nuroboot", -1105745419}, // 119153338869 modulo 2^32, with its sign
    // Only letters count, up to the first character that is none.
    {"sda{", 0},
    {"sdb`a", 1},
    {"/dev/sdaB", 0},
    {"sd~", -1},
};

TEST(DiskIndexGet, ReadsTheLettersAsANumber)
{
    for (const INDEX_CASE &row : INDEX_CASES) {
        EXPECT_EQ(DiskIndexGet(row.szName), row.index) << row.szName;
    }
}

TEST(DiskIndexGet, NumbersEveryNameOfUpToThreeLettersInTurn)
{
    std::string name = "sda";
    for (int index = 0; index < 26 + 26 * 26 + 26 * 26 * 26; index++) {
        ASSERT_EQ(DiskIndexGet(name.c_str()), index) << name;
        size_t i = name.size();
        while (i > 2 && name[i - 1] == 'z') {
            name[--i] = 'a';
        }
        if (i == 2) {
            name.insert(2, 1, 'a');
        } else {
            name[i - 1]++;
        }
    }
}

struct NUMBER_CASE {
    const char *szName;
    size_t cbDisk;
    int number;
    const char *szDisk;
};

constexpr NUMBER_CASE NUMBER_CASES[] = {
    {"sdc", 32, 0, "sdc"},
    {"sdc3", 32, 3, "sdc"},
    {"sda10", 32, 10, "sda"},
    {"sdaa128", 32, 128, "sdaa"},
    {"/dev/sdb3", 32, 3, "/dev/sdb"},
    {"isda1", 32, 1, "isda"},
    {"nuroboot", 32, 0, "nuroboot"},
    {"nuroboot1", 32, 1, "nuroboot"},
    // The disk ends at 1 to 9, not at 0.
    {"sda0", 32, 0, "sda0"},
    {"sda01", 32, 1, "sda0"},
    {"sda102", 32, 102, "sda"},
    {"md0", 32, 0, "md0"},
    {"loop10p1", 32, 10, "loop"},
    // What follows the number does not matter.
    {"sda3x", 32, 3, "sda"},
    {"sda3 4", 32, 3, "sda"},
    {"sd 1", 32, 1, "sd "},
    {"sda-3", 32, 3, "sda-"},
    // No disk in front of the number.
    {"", 32, -1, ""},
    {"1", 32, -1, ""},
    {"3sda", 32, -1, ""},
    // A card's disk ends at the p.
    {"mmcblk0", 32, 0, "mmcblk0"},
    {"mmcblk1", 32, 0, "mmcblk1"},
    {"mmcblk0p3", 32, 3, "mmcblk0"},
    {"mmcblk12p10", 32, 10, "mmcblk12"},
    {"mmcblk0p0", 32, 0, "mmcblk0"},
    {"mmcblk0p03", 32, 3, "mmcblk0"},
    {"mmcblk0p-3", 32, -3, "mmcblk0"},
    {"mmcblk0p+3", 32, 3, "mmcblk0"},
    {"mmcblk0p 3", 32, 3, "mmcblk0"},
    {"/dev/mmcblk0p2", 32, 2, "/dev/mmcblk0"},
    {"mmcblk0p", 32, -1, "mmcblk0"},
    {"mmcblk0px", 32, -1, "mmcblk0"},
    {"mmcblk0p-", 32, -1, "mmcblk0"},
    {"mmcblk0pp1", 32, -1, "mmcblk0"},
    {"mmcblk", 32, 0, "mmcblk"},
    {"pmmcblk0", 32, -1, ""},
    {"xpmmcblk0p1", 32, -1, "x"},
    // A number beyond 32 bits is clamped.
    {"sda2147483647", 32, INT_MAX, "sda"},
    {"sda2147483648", 32, INT_MAX, "sda"},
    {"sda4294967299", 32, INT_MAX, "sda"},
    {"sda99999999999999999999999", 32, INT_MAX, "sda"},
    {"mmcblk0p-2147483648", 32, INT_MIN, "mmcblk0"},
    {"mmcblk0p-4294967299", 32, INT_MIN, "mmcblk0"},
    // The buffer takes the whole disk and no byte more.
    {"sdc", 4, 0, "sdc"},
    {"sdc3", 4, 3, "sdc"},
    {"mmcblk0", 8, 0, "mmcblk0"},
    {"mmcblk0p3", 8, 3, "mmcblk0"},
    // A disk that is cut is not the whole name, and what comes next decides.
    {"sdc", 3, -1, "sd"},
    {"sdc3", 3, -1, "sd"},
    {"sda03", 4, 3, "sda"},
    {"sda 3", 4, 3, "sda"},
    {"sda-3", 4, -3, "sda"},
    {"sda+3", 4, 3, "sda"},
    {"sda--3", 4, -1, "sda"},
    {"mmcblk0", 7, -1, "mmcblk"},
    {"mmcblk0p3", 7, -1, "mmcblk"},
    {"mmcblk0p3", 4, -1, "mmc"},
    // One byte holds no disk at all; it is not a width without limit.
    {"sdc", 1, -1, ""},
    {"sdc3", 1, -1, ""},
    {"mmcblk0p3", 1, -1, ""},
    {"", 1, -1, ""},
};

TEST(DiskPartitionNumGet, SplitsNameIntoDiskAndNumber)
{
    for (const NUMBER_CASE &row : NUMBER_CASES) {
        EXPECT_EQ(NumberGet(row.szName, row.cbDisk), TOLD(row.number, row.szDisk))
            << '"' << row.szName << "\" into " << row.cbDisk;
    }
}

TEST(DiskPartitionNumGet, TakesDisksOfUpTo31LettersIntoTheUsualBuffer)
{
    EXPECT_EQ(NumberGet(Letters(31) + "7"), TOLD(7, Letters(31)));
    EXPECT_EQ(NumberGet(Letters(31)), TOLD(0, Letters(31)));
    EXPECT_EQ(NumberGet(Letters(32)), TOLD(-1, Letters(31)));
    EXPECT_EQ(NumberGet(Letters(32) + "7"), TOLD(-1, Letters(31)));
}

struct REMOVE_CASE {
    const char *szPart;
    const char *szDisk;
};

constexpr REMOVE_CASE REMOVE_CASES[] = {
    {"/dev/sda3", "/dev/sda"},
    {"/dev/sda12", "/dev/sda"},
    {"/dev/sda", "/dev/sda"},
    {"sdaa1", "sdaa"},
    {"sda", "sda"},
    {"", ""},
    {"isda2", "isda"},
    {"nuroboot1", "nuroboot"},
    // Any digit ends the disk here, 0 included.
    {"sda0", "sda"},
    {"sda10", "sda"},
    {"md0", "md"},
    {"sd0a1", "sd"},
    {"1sda", ""},
    {"loop10p1", "loop"},
    // A card's disk ends at the last p, if a digit comes next.
    {"mmcblk0p2", "mmcblk0"},
    {"mmcblk0p12", "mmcblk0"},
    {"mmcblk12p3", "mmcblk12"},
    {"/dev/mmcblk0p2", "/dev/mmcblk0"},
    {"mmcblk0", "mmcblk0"},
    {"mmcblk1", "mmcblk1"},
    {"mmcblk0p0", "mmcblk0"},
    {"mmcblk0p", "mmcblk0p"},
    {"mmcblk0px1", "mmcblk0px1"},
    {"mmcblk0p2x", "mmcblk0"},
    {"mmcblk0p1p2", "mmcblk0p1"},
    {"mmcblk0p1p", "mmcblk0p1p"},
    {"mmcblk0p1px", "mmcblk0p1px"},
    {"p1mmcblk", ""},
};

TEST(DiskPartitionNumRemove, CutsTheNumber)
{
    for (const REMOVE_CASE &row : REMOVE_CASES) {
        EXPECT_EQ(NumberRemove(row.szPart), TOLD(0, row.szDisk)) << row.szPart;
    }
}

TEST(DiskPartitionNumRemove, NeedsRoomForTheWholeNameNotForTheDiskAlone)
{
    const std::string untouched(128, UNTOUCHED);
    for (const REMOVE_CASE &row : REMOVE_CASES) {
        SCOPED_TRACE(row.szPart);
        EXPECT_EQ(NumberRemove(row.szPart, strlen(row.szPart) + 1), TOLD(0, row.szDisk));
        EXPECT_EQ(NumberRemove(row.szPart, strlen(row.szPart)), TOLD(-1, untouched));
    }
}

TEST(DiskPartitionNumRemove, TakesUpTo31CharactersIntoTheUsualBuffer)
{
    const std::string untouched(128, UNTOUCHED);
    EXPECT_EQ(NumberRemove(Letters(31)), TOLD(0, Letters(31)));
    EXPECT_EQ(NumberRemove(Letters(30) + "1"), TOLD(0, Letters(30)));
    EXPECT_EQ(NumberRemove(Letters(32)), TOLD(-1, untouched));
    EXPECT_EQ(NumberRemove(Letters(31) + "1"), TOLD(-1, untouched));
}

struct PARTITION_CASE {
    const char *szDisk;
    int partNum;
    const char *szName;
};

constexpr PARTITION_CASE PARTITION_CASES[] = {
    {"/dev/sda", 3, "sda3"},
    {"/dev/sda", 5, "sda5"},
    {"sda", 3, "sda3"},
    {"sdb", 1, "sdb1"},
    {"sdaa", 12, "sdaa12"},
    {"isda", 1, "isda1"},
    {"/dev/isda", 2, "isda2"},
    {"/dev/mmcblk0", 1, "mmcblk0p1"},
    {"/dev/mmcblk1", 2, "mmcblk1p2"},
    {"mmcblk0", 3, "mmcblk0p3"},
    {"xmmcblk0", 3, "xmmcblk0p3"},
    {"nvme0n1", 1, "nvme0n11"}, // the p is for cards alone
    {"sda1", 2, "sda12"},
    {"", 1, "1"},
    {"/dev/", 1, "1"},
    {"/devsda", 1, "da1"}, // five characters go, whatever the fifth is
    {"/dev/dev/sda", 1, "dev/sda1"},
    {"x/dev/sda", 1, "x/dev/sda1"},
    {"xnuroboot", 1, "xnuroboot1"},
    {"sda", INT_MAX, "sda2147483647"},
};

TEST(DiskDevicePartitionNameGet, PutsTheNumberBehindTheName)
{
    for (const PARTITION_CASE &row : PARTITION_CASES) {
        EXPECT_EQ(NameGet(row.szDisk, row.partNum, 32), TOLD(0, row.szName)) << row.szDisk;
    }
}

TEST(DiskDevicePartitionPathGet, PutsDevInFront)
{
    for (const PARTITION_CASE &row : PARTITION_CASES) {
        EXPECT_EQ(PathGet(row.szDisk, row.partNum), TOLD(0, std::string("/dev/") + row.szName))
            << row.szDisk;
    }
}

TEST(DiskDevicePartitionNameGet, CutsToTheCallersBuffer)
{
    const std::string whole = "mmcblk0p12";
    for (size_t cb = 1; cb <= whole.size() + 1; cb++) {
        EXPECT_EQ(NameGet("/dev/mmcblk0", 12, cb), TOLD(0, whole.substr(0, cb - 1)));
    }
}

TEST(DiskDevicePartitionPathGet, CutsToTheCallersBuffer)
{
    const std::string whole = "/dev/sda12";
    for (size_t cb = 1; cb <= whole.size() + 1; cb++) {
        EXPECT_EQ(PathGet("sda", 12, cb), TOLD(0, whole.substr(0, cb - 1)));
    }
}

// The name is cut to 31 characters before the number is put behind it, and in a path once more
// after.
TEST(DiskDevicePartitionNameGet, CutsLongNames)
{
    const struct {
        std::string disk;
        std::string name;
        std::string path;
    } rows[] = {
        {Letters(30), Letters(30) + "4", "/dev/" + Letters(30) + "4"},
        {Letters(31), Letters(31) + "4", "/dev/" + Letters(31)},
        {Letters(32), Letters(31) + "4", "/dev/" + Letters(31)},
        {Letters(33), Letters(31) + "4", "/dev/" + Letters(31)},
        {"/dev/" + Letters(31), Letters(31) + "4", "/dev/" + Letters(31)},
        {"/dev/" + Letters(32), Letters(31) + "4", "/dev/" + Letters(31)},
        // What is cut away does not make a card of a disk.
        {Letters(25) + "mmcblk", Letters(25) + "mmcblkp4", "/dev/" + Letters(25) + "mmcblk"},
        {Letters(26) + "mmcblk", Letters(26) + "mmcbl4", "/dev/" + Letters(26) + "mmcbl"},
    };
    for (const auto &row : rows) {
        SCOPED_TRACE(row.disk);
        EXPECT_EQ(NameGet(row.disk, 4), TOLD(0, row.name));
        EXPECT_EQ(PathGet(row.disk, 4), TOLD(0, row.path));
    }
}

TEST(DiskDevicePartitionNameGet, RefusesWhatHasNoPartitions)
{
    GUARDED_BUFFER out(0);
    char *const szOut = out.text.data();
    const struct {
        const char *szDisk;
        int partNum;
        char *szOut;
        size_t cbOut;
    } rows[] = {
        {nullptr, 1, szOut, 32},     {"sda", 1, nullptr, 32},
        {"sda", 1, szOut, 0},        {"sda", 0, szOut, 32},
        {"sda", -1, szOut, 32},      {"sda", INT_MIN, szOut, 32},
        {"nuroboot", 1, szOut, 32},  {"/dev/nuroboot", 1, szOut, 32},
        {"nurobootx", 1, szOut, 32}, {"/dev/nuroboot1", 1, szOut, 32},
    };
    RecordReset();
    for (const auto &row : rows) {
        EXPECT_EQ(DiskDevicePartitionNameGet(row.szDisk, row.partNum, row.szOut, row.cbOut), -1);
        EXPECT_EQ(DiskDevicePartitionPathGet(row.szDisk, row.partNum, row.szOut, row.cbOut), -1);
    }
    EXPECT_TRUE(IsRestKept(out));
    EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
}

TEST(DiskIsExist, WhatIsNoBlockDeviceDoesNotExist)
{
    RecordReset();
    EXPECT_EQ(DiskIsExist("/dev/no-such-disk"), 0);
    EXPECT_EQ(DiskIsExist("/"), 0);
    EXPECT_EQ(DiskIsExist("/dev/null"), 0);
    EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
}

TEST(DevicePath, IsTheNameInItsDirectory)
{
    EXPECT_STREQ(DevicePathOf("sda").sz, "/dev/sda");
    EXPECT_STREQ(DevicePathOf("mmcblk0p1").sz, "/dev/mmcblk0p1");
    EXPECT_STREQ(DevicePathOf("").sz, "/dev/");
    EXPECT_STREQ(DevicePathOf("/dev/sda").sz, "/dev//dev/sda");
    EXPECT_STREQ(DevicePathOf("abcdefghijklmnopqrstuvwxyz").sz, "/dev/abcdefghijklmnopqrstuvwxyz");
    EXPECT_STREQ(DevicePathOf("abcdefghijklmnopqrstuvwxyz1").sz, "/dev/abcdefghijklmnopqrstuvwxyz");
}

TEST(DevicePath, IsCutToTheCallersBuffer)
{
    char szPath[16] = "untouched-bytes";
    DevicePathBuild("sda", szPath, 8);
    EXPECT_STREQ(szPath, "/dev/sd");
    EXPECT_STREQ(szPath + 8, "d-bytes");
    DevicePathBuild("sda", szPath, 9);
    EXPECT_STREQ(szPath, "/dev/sda");
    DevicePathBuild("sda", szPath, 1);
    EXPECT_STREQ(szPath, "");
}

struct NAME_CASE {
    const char *szPath;
    const char *szLeading; // behind a leading "/dev/"
    const char *szWithin;  // behind "/dev" and a "/", wherever
};

constexpr NAME_CASE NAME_CASES[] = {
    {"sda", "sda", "sda"},
    {"/dev/sda3", "sda3", "sda3"},
    {"/dev/", "", ""},
    {"/dev", "/dev", "/dev"},
    {"/devsda", "/devsda", "/devsda"},
    {"/devices/sda", "/devices/sda", "sda"},
    {"/tmp/dev/sda", "/tmp/dev/sda", "sda"},
    {"dev/sda", "dev/sda", "dev/sda"},
    {"/dev/mapper/sda", "mapper/sda", "mapper/sda"},
    {"/dev//dev/sda", "/dev/sda", "/dev/sda"},
    {"", "", ""},
};

TEST(DeviceName, IsWhatStandsBehindTheDirectory)
{
    for (const NAME_CASE &row : NAME_CASES) {
        SCOPED_TRACE(row.szPath);
        EXPECT_STREQ(DeviceNameOf(row.szPath), row.szLeading);
        EXPECT_STREQ(DeviceNameWithin(row.szPath), row.szWithin);
    }
}

TEST(DiskPartitionNumGet, ClearsTheWholeBuffer)
{
    const std::pair<const char *, TOLD> rows[] = {{"sda12", {12, "sda"}},
                                                  {"sdb", {0, "sdb"}},
                                                  {"mmcblk0p3", {3, "mmcblk0"}},
                                                  {"", {-1, ""}},
                                                  {"12", {-1, ""}}};
    for (const auto &[szName, told] : rows) {
        SCOPED_TRACE(szName);
        std::string buffer(24, '~');
        EXPECT_EQ(DiskPartitionNumGet(szName, buffer.data(), 16), told.first);
        std::string expected = told.second;
        expected.resize(16, '\0');
        EXPECT_EQ(buffer, expected + "~~~~~~~~");
    }
}

} // namespace
