// SPDX-License-Identifier: MIT
#include "hwcontrol/disk_name.h"
#include "hwcontrol/disk_path.h"
#include "hwcontrol/disk_port.h"

#include "nurocore/error.h"
#include "steps.h"
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
    return WithFile(MachineWithConf("usbportcfg=0x10\nesataportcfg=0xc0\ninternalportcfg=0xf\n"
                                    "cacheportcfg=0x20\n"),
                    "/sys/class/scsi_host/host0/nuro_pm_info",
                    "nuro_device_list=/dev/sdg,/dev/sdha,/dev/sdhb\n");
}

// Parses into a place that holds 99 before.
void ExpectInfo(const MACHINE &machine, const std::string &szPath, int result,
                const DISK_PATH_INFO &expected, const STEPS &steps)
{
    SCOPED_TRACE(szPath);
    const RUN_RESULT run = MachineCall(machine, [&] {
        DISK_PATH_INFO info = {99, 99, 99, 99};
        RecordReset();
        EXPECT_EQ(DiskPathParse(szPath.c_str(), &info), result);
        EXPECT_EQ(info.diskIndex, expected.diskIndex);
        EXPECT_EQ(info.container, expected.container);
        EXPECT_EQ(info.unitIndex, expected.unitIndex);
        EXPECT_EQ(info.partitionNum, expected.partitionNum);
    });
    ExpectSteps(run, steps);
}

// Nothing is stored, and the path is told behind what else is.
void ExpectNoInfo(const MACHINE &machine, const std::string &szPath, const std::string &szTold)
{
    ExpectInfo(
        machine, szPath, -1, {99, 99, 99, 99},
        {{szTold}, {"<11>disk_path.cpp:# bad paramters: unknown device, disk path: " + szPath}});
}

std::string NoMatch(const std::string &szNamed)
{
    return "<15>disk_port.cpp:# expected sdx or /dev/sdx, not " + szNamed +
           ", not match any port type";
}

struct PARSE_CASE {
    const char *szPath;
    DISK_PATH_INFO info;
    STEPS steps = {};
};

const STEPS UNKNOWN_TYPE = {{"<11>disk_path.cpp:# Unknown diskType"}};

// index, container, unit, partition
const PARSE_CASE PARSE_CASES[] = {
    {"/dev/sdb3", {2, 1, 0, 3}},
    {"sdb3", {2, 1, 0, 3}},
    {"sda", {1, 1, 0, 0}},
    {"/dev/sdd", {4, 1, 0, 0}},
    {"sda10", {1, 1, 0, 10}},
    {"sda0", {1, 1, 0, 0}},
    {"/dev/sde1", {5, 4, 0, 1}},
    {"sdf", {6, 32, 0, 0}},
    {"sdi2", {9, 4, 0, 2}}, // no mask names it: counted as USB
    {"sdz", {26, 4, 0, 0}},
    {"sdaa", {27, 4, 0, 0}},
    {"sdzz", {702, 4, 0, 0}},
    // eSATA without the unit: sdhc is index 7·26 + 26 + 2 = 210
    {"/dev/sdhc1", {211, 8, 0, 1}},
    // Disks of the unit: sdha is index 8·26 = 208, h the eighth letter.
    {"sdg", {7, 2, 7, 0}},
    {"/dev/sdg", {7, 2, 7, 0}},
    {"/dev/sdg2", {7, 2, 7, 2}},
    {"sdha", {209, 2, 8, 0}},
    {"/dev/sdha", {209, 2, 8, 0}},
    {"/dev/sdhb12", {210, 2, 8, 12}},
    {"sdh", {8, 2, 8, 0}}, // loose: sdh is in sdha
    // Of these types nothing is known but their names; i s d a is 171132.
    {"isda", {171133, 1, 0, 0}, UNKNOWN_TYPE},
    {"/dev/isdb2", {171134, 1, 0, 2}, UNKNOWN_TYPE},
    {"nuroboot", {-1105745418, 1, 0, 0}, UNKNOWN_TYPE},
    {"/dev/nuroboot1", {-1105745418, 1, 0, 1}, UNKNOWN_TYPE},
    {"mmcblk0", {160452979, 4, 0, 0}},
    {"/dev/mmcblk0p3", {160452979, 4, 0, 3}},
    // No letters: index -1.
    {"sd", {0, 4, 0, 0}},
    {"sd1", {0, 4, 0, 1}},
    // The letters that stand for 2147483647; one more is counted modulo 2^32, too.
    {"sdfxshrxw", {INT_MAX, 4, 0, 0}},
    {"sdfxshrxx", {INT_MIN, 4, 0, 0}},
};

TEST(DiskPathParse, DescribesDisksOfEveryPort)
{
    for (const PARSE_CASE &row : PARSE_CASES) {
        ExpectInfo(MachineWithPorts(), row.szPath, 0, row.info, row.steps);
    }
}

TEST(DiskPathParse, FailsForUnknownDevices)
{
    const MACHINE machine = MachineWithPorts();
    ExpectNoInfo(machine, "hda", NoMatch("hda"));
    ExpectNoInfo(machine, "/dev/hda1", NoMatch("hda"));
    ExpectNoInfo(machine, "/dev/md2", NoMatch("md"));
    ExpectNoInfo(machine, "", NoMatch(""));
}

TEST(DiskPathParse, FailsForAnyDiskWithoutTheMasks)
{
    ExpectNoInfo(MachineMake(), "/dev/sda1",
                 "<11>disk_port.cpp:# Get usbportcfg key from /etc.defaults/nuroinfo.conf Error");
}

TEST(DiskPathParse, FailsForPathsOf32Characters)
{
    const std::string path = "/dev/sd" + std::string(25, 'x');
    ExpectNoInfo(MachineWithPorts(), path,
                 "<11>disk_name.cpp:# buffer size of szDiskPath should be longer than string "
                 "length of szPartPath");
    QuietCall(MachineWithPorts(), [&path] {
        DISK_PATH_INFO info = {};
        EXPECT_EQ(DiskPathParse(path.substr(0, 31).c_str(), &info), 0);
        EXPECT_EQ(info.partitionNum, 0);
    });
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

// ---- bad arguments to the whole library --------------------------------------------------------

char szPlace[32] = "x";
DISK_PATH_INFO infoPlace;
u32 maskPlace = OLD_MASK;
PNLIBSZLIST pNone = nullptr;

constexpr char BAD_NUMBER[] = "<15>disk_name.cpp:# Bad parameters";
constexpr char BAD_REQUEST[] = "<11>disk_name.cpp:# out put szPartitionPath can not be NULL and "
                               "path length can't be zero";
constexpr char BOOT_REFUSED[] =
    "<11>disk_name.cpp:# we don't generate nuroboot partition name here";
constexpr char NO_LIST[] = "<11>disk_port.cpp:# device name list can not be NULL";

struct BAD_CASE {
    const char *szName;
    int (*pCall)();
    STEPS steps = {};
    u32 code = OLD_CODE;
    int result = -1;
    const char *szStored = "x"; // as before
};

const BAD_CASE BAD_CASES[] = {
    {"parse, no path", [] { return DiskPathParse(nullptr, &infoPlace); }, {}, ERR_BAD_PARAMETER},
    {"parse, no place", [] { return DiskPathParse("/dev/sda", nullptr); }, {}, ERR_BAD_PARAMETER},
    {"container, unknown", [] { return DiskContainerGet("hda", &maskPlace); }, {{NoMatch("hda")}}},
    {"container, no path",
     [] { return DiskContainerGet(nullptr, &maskPlace); },
     {{"<11>disk_path.cpp:# bad paramters"}}},
    {"container, no place",
     [] { return DiskContainerGet("sda", nullptr); },
     {{"<11>disk_path.cpp:# bad paramters"}}},
    {"number, no path",
     [] { return DiskPartitionNumRemove(nullptr, szPlace, 32); },
     {{BAD_NUMBER}}},
    {"number, no place",
     [] { return DiskPartitionNumRemove("sda1", nullptr, 32); },
     {{BAD_NUMBER}}},
    {"number, no room", [] { return DiskPartitionNumRemove("sda1", szPlace, 0); }, {{BAD_NUMBER}}},
    {"number, less room",
     [] { return DiskPartitionNumRemove("sda1", szPlace, -1); },
     {{BAD_NUMBER}}},
    {"number, too little room",
     [] { return DiskPartitionNumRemove("sda1", szPlace, 4); },
     {{"<11>disk_name.cpp:# buffer size of szDiskPath should be longer than string length of "
       "szPartPath"}}},
    {"number, room",
     [] { return DiskPartitionNumRemove("sda1", szPlace, 5); },
     {},
     OLD_CODE,
     0,
     "sda"},
    {"boot",
     [] { return DiskDevicePartitionNameGet("nuroboot", 1, szPlace, 32); },
     {{BOOT_REFUSED}}},
    {"boot's path",
     [] { return DiskDevicePartitionNameGet("/dev/nuroboot", 2, szPlace, 32); },
     {{BOOT_REFUSED}}},
    {"path of boot",
     [] { return DiskDevicePartitionPathGet("/dev/nuroboot", 1, szPlace, 32); },
     {{BOOT_REFUSED}, {"<11>disk_name.cpp:# fail to get device partition name"}}},
    {"port, no path",
     [] { return static_cast<int>(ExternalDiskPortCheck(nullptr)); },
     {{"<11>disk_port.cpp:# device path should not be NULL"}},
     OLD_CODE,
     UNKNOWN_DEVICE},
    {"port, no name",
     [] { return static_cast<int>(ExternalDiskPortCheckName(nullptr)); },
     {},
     ERR_BAD_PARAMETER,
     UNKNOWN_DEVICE},
    {"units, no place",
     [] { return ExternalDiskPortEnumEunit(0, nullptr, 1024); },
     {},
     ERR_BAD_PARAMETER},
    {"units, no room",
     [] { return ExternalDiskPortEnumEunit(0, szPlace, 0); },
     {},
     ERR_BAD_PARAMETER},
    {"disks, no place", [] { return ExternalDiskPortEnum(INTERNAL_DEVICE, nullptr); }, {{NO_LIST}}},
    {"disks, no list", [] { return ExternalDiskPortEnum(INTERNAL_DEVICE, &pNone); }, {{NO_LIST}}},
    {"no disks, no place", [] { return ExternalDiskPortEnum(OTHER_DEVICE, nullptr); }, {{NO_LIST}}},
};

// And nothing is stored.
TEST(HwControl, BadArgumentsAreTold)
{
    for (const BAD_CASE &row : BAD_CASES) {
        ExpectCall({.szName = row.szName,
                    .machine = MachineWithPorts(),
                    .call =
                        [&row] {
                            const int result = row.pCall();
                            EXPECT_EQ(maskPlace, OLD_MASK);
                            EXPECT_EQ(szPlace, std::string(row.szStored));
                            return result;
                        },
                    .result = row.result,
                    .code = row.code,
                    .steps = row.steps});
    }
}

using PARTITION_NAMER = int (*)(const char *, int, char *, size_t);

TEST(HwControl, BadRequestsForANameAreTold)
{
    const struct {
        const char *szDisk;
        int partNum;
        char *szOut;
        size_t cbOut;
    } rows[] = {{"sda", 1, szPlace, 0},
                {"sda", 1, nullptr, 32},
                {nullptr, 1, szPlace, 32},
                {"sda", 0, szPlace, 32},
                {"sda", -1, szPlace, 32}};
    const PARTITION_NAMER namers[] = {DiskDevicePartitionNameGet, DiskDevicePartitionPathGet};
    for (const PARTITION_NAMER pNamer : namers) {
        for (const auto &row : rows) {
            ExpectCall(
                {.szName = "refused",
                 .call = [&] { return pNamer(row.szDisk, row.partNum, row.szOut, row.cbOut); },
                 .result = -1,
                 .steps = {{BAD_REQUEST}}});
        }
        IdleCall(MachineMake(), [pNamer] { EXPECT_EQ(pNamer("sda", 1, szPlace, 1), 0); });
    }
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
