// SPDX-License-Identifier: MIT
#include "hwcontrol/disk_name.h"

#include <gtest/gtest.h>

#include <string>

namespace
{

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

struct CLEARED_CASE {
    const char *szName;
    int result;
    const char *szDisk;
};

TEST(DiskPartitionNumGet, ClearsTheWholeBuffer)
{
    for (const CLEARED_CASE &row : {CLEARED_CASE{"sda12", 12, "sda"},
                                    {"sdb", 0, "sdb"},
                                    {"mmcblk0p3", 3, "mmcblk0"},
                                    {"", -1, ""},
                                    {"12", -1, ""}}) {
        SCOPED_TRACE(row.szName);
        std::string buffer(24, '~');
        EXPECT_EQ(DiskPartitionNumGet(row.szName, buffer.data(), 16), row.result);
        std::string expected = row.szDisk;
        expected.resize(16, '\0');
        EXPECT_EQ(buffer, expected + "~~~~~~~~");
    }
}

} // namespace
