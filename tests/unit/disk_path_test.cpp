// SPDX-License-Identifier: MIT
#include "hwcontrol/disk_path.h"

#include "last_error.h"

#include <cstddef>

// Cards and the boot device are told by their names alone; what the model's port masks decide
// needs a machine and is tested in the sandbox.

namespace
{

constexpr u32 OLD_MASK = 0xA5A5A5A5;

TEST(DiskPathInfo, HasFourFieldsInOrder)
{
    EXPECT_EQ(offsetof(DISK_PATH_INFO, diskIndex), 0U);
    EXPECT_EQ(offsetof(DISK_PATH_INFO, container), 4U);
    EXPECT_EQ(offsetof(DISK_PATH_INFO, unitIndex), 8U);
    EXPECT_EQ(offsetof(DISK_PATH_INFO, partitionNum), 12U);
    EXPECT_EQ(sizeof(DISK_PATH_INFO), 16U);
}

TEST(DiskPortType, HasItsValues)
{
    EXPECT_EQ(UNKNOWN_DEVICE, 0);
    EXPECT_EQ(INTERNAL_DEVICE, 1);
    EXPECT_EQ(ESATA_DEVICE, 2);
    EXPECT_EQ(EUNIT_DEVICE, 3);
    EXPECT_EQ(USB_DEVICE, 4);
    EXPECT_EQ(BOOT_DEVICE, 5);
    EXPECT_EQ(ISD_DEVICE, 6);
    EXPECT_EQ(CACHE_DEVICE, 7);
    EXPECT_EQ(OTHER_DEVICE, 8);
    EXPECT_EQ(MMC_DEVICE, 9);
}

struct CONTAINER_CASE {
    int type;
    int result;
    u32 mask;
};

constexpr CONTAINER_CASE CONTAINER_CASES[] = {
    {0, -1, OLD_MASK},  {1, 0, 1},          {2, 0, 8},          {3, 0, 2}, {4, 0, 4},
    {5, -1, OLD_MASK},  {6, -1, OLD_MASK},  {7, 0, 32},         {8, 0, 4}, {9, -1, OLD_MASK},
    {10, -1, OLD_MASK}, {11, -1, OLD_MASK}, {15, -1, OLD_MASK},
};

TEST(DiskContainerFromPortType, MapsThePortTypes)
{
    RecordReset();
    for (const CONTAINER_CASE &row : CONTAINER_CASES) {
        u32 mask = OLD_MASK;
        EXPECT_EQ(DiskContainerFromPortType(static_cast<DISK_PORT_TYPE>(row.type), &mask),
                  row.result)
            << row.type;
        EXPECT_EQ(mask, row.mask) << row.type;
    }
    EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
}

TEST(DiskContainerGet, HasNoneForCardsAndTheBootDevice)
{
    for (const char *szPath : {"mmcblk0", "/dev/mmcblk0p1", "nuroboot", "/dev/nuroboot1"}) {
        u32 mask = OLD_MASK;
        EXPECT_EQ(DiskContainerGet(szPath, &mask), -1) << szPath;
        EXPECT_EQ(mask, OLD_MASK) << szPath;
    }
}

struct PARSE_CASE {
    const char *szPath;
    DISK_PATH_INFO info;
};

// The indices are those of the letters, plus 1: m m c b l k is 160452978; n u r o b o o t is
// 119153338869, modulo 2^32 and with its sign -1105745419.
constexpr PARSE_CASE PARSE_CASES[] = {
    {"mmcblk0", {160452979, 4, 0, 0}},          {"/dev/mmcblk0", {160452979, 4, 0, 0}},
    {"/dev/mmcblk0p3", {160452979, 4, 0, 3}},   {"mmcblk1p12", {160452979, 4, 0, 12}},
    {"mmcblk0p", {160452979, 4, 0, -1}}, // no number after the p: parsed all the same
    {"nuroboot", {-1105745418, 1, 0, 0}},       {"/dev/nuroboot", {-1105745418, 1, 0, 0}},
    {"/dev/nuroboot2", {-1105745418, 1, 0, 2}},
};

TEST(DiskPathParse, CountsACardAsUsbAndTheBootDeviceAsInternal)
{
    for (const PARSE_CASE &row : PARSE_CASES) {
        SCOPED_TRACE(row.szPath);
        DISK_PATH_INFO info = {99, 99, 99, 99};
        RecordReset();
        EXPECT_EQ(DiskPathParse(row.szPath, &info), 0);
        EXPECT_EQ(info.diskIndex, row.info.diskIndex);
        EXPECT_EQ(info.container, row.info.container);
        EXPECT_EQ(info.unitIndex, row.info.unitIndex);
        EXPECT_EQ(info.partitionNum, row.info.partitionNum);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    }
}

} // namespace
