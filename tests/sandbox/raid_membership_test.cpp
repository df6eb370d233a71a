// SPDX-License-Identifier: MIT
#include "nurostoragecore/raid_membership.h"

#include "nurocore/error.h"
#include "nurocore/types.h"
#include "steps.h"
#include "storage_machine.h"
#include "streams.h"

#include <cerrno>
#include <functional>
#include <gtest/gtest.h>
#include <string>
#include <syslog.h>

namespace
{

constexpr int UNTOUCHED = 4711;

void Expect(const char *szName, const std::function<long long()> &call, int result,
            const STEPS &steps, const MACHINE &machine = MachineMake(), u32 code = OLD_CODE)
{
    (void)ExpectCall({szName, machine, call, result, code, steps});
}

// A partition or disk is examined.
STEP Examined(const char *szDevice, const std::string &szReport)
{
    return {std::string("/sbin/mdadm -E /dev/") + szDevice, {.szOut = szReport}};
}

// ---- the array of a superblock -----------------------------------------------------------------

// The number, which is left alone unless there is one.
long long SuperblockMdGet(int nMdExpected)
{
    int nMd = UNTOUCHED;
    const int result = RAIDDiskSuperblockMdGet("/dev/sda3", &nMd);
    EXPECT_EQ(nMd, nMdExpected);
    return result;
}

long long NoSuperblockMd()
{
    return SuperblockMdGet(UNTOUCHED);
}

struct SUPERBLOCK_CASE {
    const char *szReport;
    int nMd;
};

constexpr SUPERBLOCK_CASE SUPERBLOCK_CASES[] = {
    {"Preferred Minor : 2\n", 2},     {"Preferred Minor : 0\n", 0},
    {"Preferred Minor : 127\n", 127}, {"           Name : appliance:12\n", 12},
    {"           Name : 3\n", 3},     {"           Name : appliance:2\nPreferred Minor : 5\n", 5},
};

TEST(SuperblockMd, IsTheNumberThatTheSuperblockNames)
{
    for (const SUPERBLOCK_CASE &row : SUPERBLOCK_CASES) {
        Expect(row.szReport, [&row] { return SuperblockMdGet(row.nMd); }, 1,
               {Examined("sda3", row.szReport)});
    }
}

TEST(SuperblockMd, IsNoneWhereExaminationFails)
{
    const std::string szMinor = "Preferred Minor : 2\n";
    Expect("a blank report", NoSuperblockMd, 0, {Examined("sda3", "")});
    Expect("no superblock", NoSuperblockMd, 0,
           {{"/sbin/mdadm -E /dev/sda3",
             {.szErr = "mdadm: No md superblock detected on /dev/sda3.\n", .status = 1}}});
    Expect("no mdadm", NoSuperblockMd, 0, {},
           WithTool(MachineMake(), "/sbin/mdadm", TOOL_KIND::MISSING));
    // What cannot be read to its end is none.
    Expect("a version", NoSuperblockMd, 0,
           {Examined("sda3", szMinor + "        Version : twelve\n"),
            {"<11>raid_superblock.cpp:# bad version format: 'twelve'."}});
    Expect("a role", NoSuperblockMd, 0,
           {Examined("sda3", szMinor + "    Device Role : Replacement device 0\n"),
            {"<11>raid_superblock.cpp:# bad device order format: 'Replacement device 0'."}});
}

TEST(SuperblockMd, FailsForASuperblockThatNamesNoArray)
{
    const auto call = [] {
        errno = EXDEV; // nothing that is called on the way sets it
        return NoSuperblockMd();
    };
    Expect("no name", call, -1,
           {Examined("sda3", "        Version : 1.2\n"),
            {"<11>raid_membership.cpp:# Failed to sscanf [], errno=Invalid cross-device link"}});
}

TEST(RaidMembership, RefusesNull)
{
    int nMd = UNTOUCHED;
    const STEPS told = {{"<11>raid_membership.cpp:# Bad parameters"}};
    Expect("no device", [&] { return RAIDDiskSuperblockMdGet(nullptr, &nMd); }, -1, told);
    Expect("no number", [] { return RAIDDiskSuperblockMdGet("/dev/sda3", nullptr); }, -1, told);
    const auto noDisk = [&nMd] {
        const int result = RAIDDiskIsUsedByRAID(nullptr, &nMd);
        EXPECT_EQ(nMd, UNTOUCHED);
        return result;
    };
    Expect("no disk", noDisk, -1, told);
    Expect(
        "no array", [] { return RAIDIsDetected(nullptr); }, -1, {}, MachineMake(),
        ERR_BAD_PARAMETER);
}

// ---- whether a disk is taken -------------------------------------------------------------------

// The disk sda of this model, its partitions where they lie.
MACHINE DiskOf(const std::string &szConf, const DISK_PLACES &places)
{
    MACHINE machine = MachineWithConf(szConf);
    PartitionedDiskAdd(machine, "sda", places);
    return machine;
}

MACHINE BareDisk()
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineDiskAdd(machine, "sda");
    return machine;
}

STEP None(const char *szDevice)
{
    return {std::string("/sbin/mdadm -E /dev/") + szDevice, {.status = 1}};
}

STEP Found(const char *szDevice, int nMd)
{
    return Examined(szDevice, Examination(nMd));
}

// These are examined, and the disk is that array's, or free: then the number is left alone,
// whatever was found on the way.
RUN_RESULT ExpectUsed(MACHINE machine, const STEPS &examined, int nMdExpected,
                      const char *szDisk = "/dev/sda")
{
    StepsExpect(machine, examined);
    RUN_RESULT result = MachineCall(machine, [&] {
        int nMd = UNTOUCHED;
        EXPECT_EQ(RAIDDiskIsUsedByRAID(szDisk, &nMd), nMdExpected == UNTOUCHED ? 0 : 1);
        EXPECT_EQ(nMd, nMdExpected);
    });
    EXPECT_EQ(TranscriptText(result), StepsText(examined));
    return result;
}

RUN_RESULT ExpectFree(const MACHINE &machine, const STEPS &examined)
{
    return ExpectUsed(machine, examined, UNTOUCHED);
}

TEST(DiskUsed, IsToldByPartitionThreeThenFive)
{
    const RUN_RESULT result = ExpectUsed(BareDisk(), {Found("sda3", 2)}, 2);
    EXPECT_EQ(LogText(result), "");
    ExpectUsed(BareDisk(), {None("sda3"), Found("sda5", 3)}, 3);
}

TEST(DiskUsed, NeedNotTellTheNumber)
{
    Expect(
        "no number", [] { return RAIDDiskIsUsedByRAID("/dev/sda", nullptr); }, 1,
        {Found("sda3", 2)}, BareDisk());
}

TEST(DiskUsed, IsNoWithAKnownLayoutAndNoArrayOnItsPartitions)
{
    const RUN_RESULT result = ExpectFree(DiskOf(CONF_RAID, PLACES_6), {None("sda3"), None("sda5")});
    EXPECT_EQ(LogText(result), "");
}

TEST(DiskUsed, TakesWholeDisksFromOneHundredAndOneUp)
{
    for (const int nMd : {0, 2, 99, 100, 101, 127}) {
        SCOPED_TRACE(nMd);
        ExpectUsed(DiskOf(CONF_RAID, PLACES_FOREIGN),
                   {None("sda3"), None("sda5"), Found("sda", nMd)}, nMd >= 101 ? nMd : UNTOUCHED);
    }
}

TEST(DiskUsed, IsNoWithoutAnySuperblock)
{
    const RUN_RESULT result = ExpectFree(BareDisk(), {None("sda3"), None("sda5"), None("sda")});
    EXPECT_EQ(LogText(result), "<15>partition_layout.cpp:# /dev/sda: dont contain partition [1]\n");
}

// The layouts of a machine without RAID are others.
TEST(DiskUsed, AsksForTheLayoutsOfTheModel)
{
    ExpectFree(DiskOf(CONF_NO_RAID, PLACES_3_NO_RAID), {None("sda3"), None("sda5")});
    ExpectUsed(DiskOf(CONF_RAID, PLACES_3_NO_RAID), {None("sda3"), None("sda5"), Found("sda", 101)},
               101);
}

// A superblock that names no array is no answer, so the next place is asked.
TEST(DiskUsed, GoesOnBehindASuperblockThatNamesNoArray)
{
    ExpectUsed(BareDisk(), {Examined("sda3", "        Version : 1.2\n"), Found("sda5", 4)}, 4);
}

// The boot device has no partition names, so only its own superblock can tell.
TEST(DiskUsed, TheBootDeviceIsAskedAsAWhole)
{
    ExpectUsed(BareDisk(), {Found("nuroboot", 100)}, UNTOUCHED, "/dev/nuroboot");
    ExpectUsed(BareDisk(), {Found("nuroboot", 101)}, 101, "/dev/nuroboot");
}

// ---- whether an array runs ---------------------------------------------------------------------

// Asked for md2; it is closed on every way out.
long long Detected()
{
    openlog(nullptr, LOG_NDELAY, LOG_USER); // so that the log takes no new descriptor
    const int nOpen = DescriptorsCount();
    const int result = RAIDIsDetected("/dev/md2");
    EXPECT_EQ(DescriptorsCount(), nOpen);
    return result;
}

MACHINE ArrayThatAnswers(int errnoInfo)
{
    MACHINE machine = MachineMake();
    MachineMdAdd(machine, {.nMd = 2, .errnoInfo = errnoInfo});
    return machine;
}

TEST(RaidDetected, IsYesForARunningArray)
{
    Expect("running", Detected, 1, {}, ArrayThatAnswers(0));
}

TEST(RaidDetected, FailsWithoutANode)
{
    Expect("no node", Detected, -1,
           {{"<15>raid_membership.cpp:# Failed to open /dev/md2, errno=No such file or directory"}},
           MachineMake(), ERR_OPEN_FAILED);
}

// Kept: an array that is not there is a failure too, because the request reports it as one.
TEST(RaidDetected, FailsWithTheRequest)
{
    Expect("absent", Detected, -1,
           {{"<15>raid_info.cpp:# Failed to ioctl for raid status, errno=No such device"},
            {"<15>raid_membership.cpp:# Failed to ioctl /dev/md2, errno=0X8000"}},
           ArrayThatAnswers(ENODEV), ERR_SYSCALL_FAILED);
    Expect("interrupted", Detected, -1,
           {{"<15>raid_membership.cpp:# Failed to ioctl /dev/md2, errno=0XA700"}},
           ArrayThatAnswers(EINTR), ERR_INTERRUPTED);
}

} // namespace
