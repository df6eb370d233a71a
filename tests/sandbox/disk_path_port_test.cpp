// SPDX-License-Identifier: MIT
#include "hwcontrol/disk_name.h"
#include "hwcontrol/disk_path.h"

#include "last_error.h"
#include "nurocore/error.h"
#include "sandbox.h"
#include "streams.h"

#include <cerrno>
#include <climits>
#include <gtest/gtest.h>
#include <string>
#include <syslog.h>
#include <vector>

namespace
{

constexpr u32 OLD_MASK = 0xA5A5A5A5;

// A disk of every port: sda to sdd internal, sde USB, sdf cache, and behind the eSATA ports g and h
// an expansion unit of which sdg hangs alone and sdha, sdhb are reported; sdh* is plain eSATA else.
MACHINE MachineWithPorts()
{
    MACHINE machine = MachineMake();
    MachineConf(machine, "usbportcfg=0x10\nesataportcfg=0xc0\ninternalportcfg=0xf\n"
                         "cacheportcfg=0x20\n");
    MachineFile(machine, "/sys/class/scsi_host/host0/nuro_pm_info",
                "nuro_device_list=/dev/sdg,/dev/sdha,/dev/sdhb\n");
    return machine;
}

struct PARSE_CASE {
    const char *szPath;
    DISK_PATH_INFO info;
    std::string log;
};

const char UNKNOWN_TYPE[] = "<11>disk_path.cpp:# Unknown diskType\n";

// index, container, unit, partition
const PARSE_CASE PARSE_CASES[] = {
    {"/dev/sdb3", {2, 1, 0, 3}, ""},
    {"sdb3", {2, 1, 0, 3}, ""},
    {"sda", {1, 1, 0, 0}, ""},
    {"/dev/sdd", {4, 1, 0, 0}, ""},
    {"sda10", {1, 1, 0, 10}, ""},
    {"sda0", {1, 1, 0, 0}, ""},
    {"/dev/sde1", {5, 4, 0, 1}, ""},
    {"sdf", {6, 32, 0, 0}, ""},
    {"sdi2", {9, 4, 0, 2}, ""}, // no mask names it: counted as USB
    {"sdz", {26, 4, 0, 0}, ""},
    {"sdaa", {27, 4, 0, 0}, ""},
    {"sdzz", {702, 4, 0, 0}, ""},
    // eSATA without the unit: sdhc is index 7·26 + 26 + 2 = 210
    {"/dev/sdhc1", {211, 8, 0, 1}, ""},
    // Disks of the unit: sdha is index 8·26 = 208, h the eighth letter.
    {"sdg", {7, 2, 7, 0}, ""},
    {"/dev/sdg", {7, 2, 7, 0}, ""},
    {"/dev/sdg2", {7, 2, 7, 2}, ""},
    {"sdha", {209, 2, 8, 0}, ""},
    {"/dev/sdha", {209, 2, 8, 0}, ""},
    {"/dev/sdhb12", {210, 2, 8, 12}, ""},
    {"sdh", {8, 2, 8, 0}, ""}, // loose: sdh is in sdha
    // Of these types nothing is known but their names; i s d a is 171132.
    {"isda", {171133, 1, 0, 0}, UNKNOWN_TYPE},
    {"/dev/isdb2", {171134, 1, 0, 2}, UNKNOWN_TYPE},
    {"nuroboot", {-1105745418, 1, 0, 0}, UNKNOWN_TYPE},
    {"/dev/nuroboot1", {-1105745418, 1, 0, 1}, UNKNOWN_TYPE},
    {"mmcblk0", {160452979, 4, 0, 0}, ""},
    {"/dev/mmcblk0p3", {160452979, 4, 0, 3}, ""},
    // No letters: index -1.
    {"sd", {0, 4, 0, 0}, ""},
    {"sd1", {0, 4, 0, 1}, ""},
    // The letters that stand for 2147483647; one more is counted modulo 2^32, too.
    {"sdfxshrxw", {INT_MAX, 4, 0, 0}, ""},
    {"sdfxshrxx", {INT_MIN, 4, 0, 0}, ""},
};

TEST(DiskPathParse, DescribesDisksOfEveryPort)
{
    for (const PARSE_CASE &row : PARSE_CASES) {
        SCOPED_TRACE(row.szPath);
        const RUN_RESULT result = MachineCall(MachineWithPorts(), [&row] {
            DISK_PATH_INFO info = {99, 99, 99, 99};
            RecordReset();
            EXPECT_EQ(DiskPathParse(row.szPath, &info), 0);
            EXPECT_EQ(info.diskIndex, row.info.diskIndex);
            EXPECT_EQ(info.container, row.info.container);
            EXPECT_EQ(info.unitIndex, row.info.unitIndex);
            EXPECT_EQ(info.partitionNum, row.info.partitionNum);
        });
        EXPECT_EQ(LogText(result), row.log);
    }
}

TEST(DiskPathParse, FailsForUnknownDevices)
{
    const struct {
        const char *szPath;
        std::string szNamed; // in the line of the port check
    } rows[] = {{"hda", "hda"}, {"/dev/hda1", "hda"}, {"/dev/md2", "md"}, {"", ""}};
    for (const auto &row : rows) {
        SCOPED_TRACE(row.szPath);
        const RUN_RESULT result = MachineCall(MachineWithPorts(), [&row] {
            DISK_PATH_INFO info = {99, 99, 99, 99};
            EXPECT_QUIET(DiskPathParse(row.szPath, &info), -1);
            EXPECT_EQ(info.diskIndex, 99);
            EXPECT_EQ(info.container, 99U);
            EXPECT_EQ(info.unitIndex, 99);
            EXPECT_EQ(info.partitionNum, 99);
        });
        EXPECT_EQ(LogText(result),
                  "<15>disk_port.cpp:# expected sdx or /dev/sdx, not " + row.szNamed +
                      ", not match any port type\n"
                      "<11>disk_path.cpp:# bad paramters: unknown device, disk path: " +
                      row.szPath + "\n");
    }
}

TEST(DiskPathParse, FailsForAnyDiskWithoutTheMasks)
{
    const RUN_RESULT result = MachineCall(MachineMake(), [] {
        DISK_PATH_INFO info = {};
        EXPECT_EQ(DiskPathParse("/dev/sda1", &info), -1);
    });
    EXPECT_EQ(LogText(result),
              "<11>disk_port.cpp:# Get usbportcfg key from /etc.defaults/nuroinfo.conf Error\n"
              "<11>disk_path.cpp:# bad paramters: unknown device, disk path: /dev/sda1\n");
}

TEST(DiskPathParse, FailsForPathsOf32Characters)
{
    const std::string path = "/dev/sd" + std::string(25, 'x');
    const RUN_RESULT result = MachineCall(MachineWithPorts(), [&path] {
        DISK_PATH_INFO info = {};
        EXPECT_EQ(DiskPathParse(path.c_str(), &info), -1);
        EXPECT_EQ(DiskPathParse(path.substr(0, 31).c_str(), &info), 0);
        EXPECT_EQ(info.partitionNum, 0);
    });
    EXPECT_EQ(LogText(result),
              "<11>disk_name.cpp:# buffer size of szDiskPath should be longer than string length "
              "of szPartPath\n"
              "<11>disk_path.cpp:# bad paramters: unknown device, disk path: " +
                  path + "\n");
}

// The card's name is looked at up to its 31st character: a number behind that is none.
TEST(DiskPathParse, CutsTheNameOfACardAt31Characters)
{
    const std::string name = "mmcblk" + std::string(25, '1');
    QuietCall(MachineWithPorts(), [&name] {
        DISK_PATH_INFO info = {};
        EXPECT_EQ(DiskPathParse(("/dev/" + name + "p3").c_str(), &info), 0);
        EXPECT_EQ(info.partitionNum, 3);
        EXPECT_EQ(DiskPathParse(("/dev/" + name + "1p3").c_str(), &info), 0);
        EXPECT_EQ(info.partitionNum, -1);
    });
}

TEST(DiskPathParse, RefusesNullInSilence)
{
    QuietCall(MachineWithPorts(), [] {
        DISK_PATH_INFO info = {};
        EXPECT_FAILS(DiskPathParse(nullptr, &info), -1, ERR_BAD_PARAMETER);
        EXPECT_FAILS(DiskPathParse("/dev/sda", nullptr), -1, ERR_BAD_PARAMETER);
    });
}

struct CONTAINER_CASE {
    const char *szPath;
    int result;
    u32 mask;
};

constexpr CONTAINER_CASE CONTAINER_CASES[] = {
    {"/dev/sda3", 0, 1},       {"sdha", 0, 2},
    {"/dev/sde", 0, 4},        {"sdhc", 0, 8},
    {"sdf1", 0, 32},           {"sdi", 0, 4},
    {"isda", -1, OLD_MASK},    {"nuroboot", -1, OLD_MASK},
    {"mmcblk0", -1, OLD_MASK}, {"/dev/mmcblk0p1", -1, OLD_MASK},
};

TEST(DiskContainerGet, TellsTheContainerOfThePort)
{
    QuietCall(MachineWithPorts(), [] {
        RecordReset();
        for (const CONTAINER_CASE &row : CONTAINER_CASES) {
            u32 mask = OLD_MASK;
            EXPECT_EQ(DiskContainerGet(row.szPath, &mask), row.result) << row.szPath;
            EXPECT_EQ(mask, row.mask) << row.szPath;
        }
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
}

TEST(DiskContainerGet, HasNoneForUnknownDevices)
{
    const RUN_RESULT result = MachineCall(MachineWithPorts(), [] {
        u32 mask = OLD_MASK;
        EXPECT_EQ(DiskContainerGet("hda", &mask), -1);
        EXPECT_EQ(mask, OLD_MASK);
    });
    EXPECT_EQ(LogText(result), "<15>disk_port.cpp:# expected sdx or /dev/sdx, not hda, not match "
                               "any port type\n");
}

TEST(DiskContainerGet, LogsNull)
{
    const RUN_RESULT result = MachineCall(MachineWithPorts(), [] {
        u32 mask = OLD_MASK;
        EXPECT_EQ(DiskContainerGet(nullptr, &mask), -1);
        EXPECT_EQ(DiskContainerGet("sda", nullptr), -1);
    });
    EXPECT_EQ(LogText(result),
              "<11>disk_path.cpp:# bad paramters\n<11>disk_path.cpp:# bad paramters\n");
}

// ---- what the naming functions log -------------------------------------------------------------

TEST(DiskPartitionNumRemove, LogsWhatItRefuses)
{
    const RUN_RESULT result = MachineCall(MachineMake(), [] {
        char szDisk[32];
        EXPECT_EQ(DiskPartitionNumRemove(nullptr, szDisk, 32), -1);
        EXPECT_EQ(DiskPartitionNumRemove("sda1", nullptr, 32), -1);
        EXPECT_EQ(DiskPartitionNumRemove("sda1", szDisk, 0), -1);
        EXPECT_EQ(DiskPartitionNumRemove("sda1", szDisk, -1), -1);
        EXPECT_EQ(DiskPartitionNumRemove("sda1", szDisk, 4), -1);
        EXPECT_EQ(DiskPartitionNumRemove("sda1", szDisk, 5), 0);
    });
    const std::string bad = "<15>disk_name.cpp:# Bad parameters\n";
    EXPECT_EQ(LogText(result), bad + bad + bad + bad +
                                   "<11>disk_name.cpp:# buffer size of szDiskPath should be longer "
                                   "than string length of szPartPath\n");
}

constexpr char BAD_REQUEST[] = "<11>disk_name.cpp:# out put szPartitionPath can not be NULL and "
                               "path length can't be zero\n";
constexpr char BOOT_REFUSED[] =
    "<11>disk_name.cpp:# we don't generate nuroboot partition name here\n";
constexpr char NAME_FAILED[] = "<11>disk_name.cpp:# fail to get device partition name\n";

using PARTITION_NAMER = int (*)(const char *, int, char *, size_t);

TEST(DiskDevicePartitionName, LogsBadRequests)
{
    const PARTITION_NAMER namers[] = {DiskDevicePartitionNameGet, DiskDevicePartitionPathGet};
    for (const PARTITION_NAMER pNamer : namers) {
        const RUN_RESULT result = MachineCall(MachineMake(), [pNamer] {
            char szOut[32];
            EXPECT_EQ(pNamer("sda", 1, szOut, 0), -1);
            EXPECT_EQ(pNamer("sda", 1, nullptr, 32), -1);
            EXPECT_EQ(pNamer(nullptr, 1, szOut, 32), -1);
            EXPECT_EQ(pNamer("sda", 0, szOut, 32), -1);
            EXPECT_EQ(pNamer("sda", -1, szOut, 32), -1);
            EXPECT_EQ(pNamer("sda", 1, szOut, 1), 0);
        });
        const std::string bad = BAD_REQUEST;
        EXPECT_EQ(LogText(result), bad + bad + bad + bad + bad);
    }
}

TEST(DiskDevicePartitionName, LogsTheBootDevice)
{
    const RUN_RESULT name = MachineCall(MachineMake(), [] {
        char szOut[32];
        EXPECT_EQ(DiskDevicePartitionNameGet("nuroboot", 1, szOut, 32), -1);
        EXPECT_EQ(DiskDevicePartitionNameGet("/dev/nuroboot", 2, szOut, 32), -1);
    });
    EXPECT_EQ(LogText(name), std::string(BOOT_REFUSED) + BOOT_REFUSED);
    const RUN_RESULT path = MachineCall(MachineMake(), [] {
        char szOut[32];
        EXPECT_EQ(DiskDevicePartitionPathGet("/dev/nuroboot", 1, szOut, 32), -1);
    });
    EXPECT_EQ(LogText(path), std::string(BOOT_REFUSED) + NAME_FAILED);
}

// ---- DiskIsExist -------------------------------------------------------------------------------

struct EXIST_CASE {
    const char *szPath;
    int openError; // 0: it opens
    int result;
    const char *szLog;
};

constexpr EXIST_CASE EXIST_CASES[] = {
    {"/dev/sda", 0, 1, ""},
    {"/dev/sdb", 0, 0, "<11>disk_name.cpp:# Failed to ioctl /dev/sdb, errno=Input/output error\n"},
    {"/dev/null", 0, 0,
     "<11>disk_name.cpp:# Failed to ioctl /dev/null, errno=Inappropriate ioctl for device\n"},
    {"/dev/sdz", 0, 0,
     "<11>disk_name.cpp:# Failed to open /dev/sdz, errno=No such file or directory\n"},
    {"", 0, 0, "<11>disk_name.cpp:# Failed to open , errno=No such file or directory\n"},
    // No such device or address is what an empty slot answers; no line for it, for it alone.
    {"/dev/sda", ENXIO, 0, ""},
    {"/dev/sda", ENODEV, 0, "<11>disk_name.cpp:# Failed to open /dev/sda, errno=No such device\n"},
    {"/dev/sda", ENOMEDIUM, 0,
     "<11>disk_name.cpp:# Failed to open /dev/sda, errno=No medium found\n"},
    {"/dev/sda", EACCES, 0,
     "<11>disk_name.cpp:# Failed to open /dev/sda, errno=Permission denied\n"},
};

TEST(DiskIsExist, OpensTheDeviceAndAsksItsSize)
{
    for (const EXIST_CASE &row : EXIST_CASES) {
        SCOPED_TRACE(testing::Message() << row.szPath << ' ' << row.openError);
        MACHINE machine = MachineMake();
        MachineDiskAdd(machine, "sda");
        MachineFile(machine, "/dev/sdb", "");
        machine.deviceSizes.push_back({.szPath = "/dev/sda", .cb = 6442450944});
        machine.deviceSizes.push_back({.szPath = "/dev/sdb", .errnoSize = EIO});
        if (row.openError != 0) {
            machine.faults = {{.szFunction = "open", .error = row.openError}};
        }
        const RUN_RESULT result = MachineCall(machine, [&row] {
            openlog(nullptr, LOG_NDELAY, LOG_USER); // the log's own descriptor is none of its
            const int nOpen = DescriptorsCount();
            EXPECT_QUIET(DiskIsExist(row.szPath), row.result);
            EXPECT_EQ(DescriptorsCount(), nOpen);
        });
        EXPECT_EQ(LogText(result), row.szLog);
    }
}

// A folder opens for reading alone.
TEST(DiskIsExist, OpensTheDeviceForReading)
{
    MACHINE machine = MachineMake();
    MachineFolder(machine, "/dev/sda");
    machine.deviceSizes.push_back({.szPath = "/dev/sda", .cb = 6442450944});
    QuietCall(machine, [] { EXPECT_EQ(DiskIsExist("/dev/sda"), 1); });
}

} // namespace
