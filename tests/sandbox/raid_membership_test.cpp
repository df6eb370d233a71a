// SPDX-License-Identifier: MIT
#include "nurostoragecore/raid_membership.h"

#include "last_error.h"
#include "nurocore/error.h"
#include "nurocore/types.h"
#include "storage_machine.h"

#include <cerrno>
#include <gtest/gtest.h>
#include <string>
#include <syslog.h>
#include <unistd.h>

namespace
{

constexpr int UNTOUCHED = 4711;

// ---- the array of a superblock -----------------------------------------------------------------

struct SUPERBLOCK_CASE {
    const char *szReport;
    int nMd; // UNTOUCHED: no superblock
};

constexpr SUPERBLOCK_CASE SUPERBLOCK_CASES[] = {
    {"", UNTOUCHED},
    {"Preferred Minor : 2\n", 2},
    {"Preferred Minor : 0\n", 0},
    {"Preferred Minor : 127\n", 127},
    {"           Name : appliance:12\n", 12},
    {"           Name : 3\n", 3},
    {"           Name : appliance:2\nPreferred Minor : 5\n", 5},
    // It cannot be read to its end, and so it is none.
    {"Preferred Minor : 2\n        Version : twelve\n", UNTOUCHED},
    {"Preferred Minor : 2\n    Device Role : Replacement device 0\n", UNTOUCHED},
};

TEST(SuperblockMd, IsTheNumberThatTheSuperblockNames)
{
    for (const SUPERBLOCK_CASE &row : SUPERBLOCK_CASES) {
        SCOPED_TRACE(row.szReport);
        MACHINE machine = MachineMake();
        MachineTool(machine, "/sbin/mdadm -E /dev/sda3", {.szOut = row.szReport});
        MachineCall(machine, [&row] {
            int nMd = UNTOUCHED;
            const int resultExpected = row.nMd == UNTOUCHED ? 0 : 1;
            EXPECT_EQ(RAIDDiskSuperblockMdGet("/dev/sda3", &nMd), resultExpected);
            EXPECT_EQ(nMd, row.nMd);
        });
    }
}

TEST(SuperblockMd, IsNoneWhereExaminationFails)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, "/sbin/mdadm -E /dev/sda3",
                {.szErr = "mdadm: No md superblock detected on /dev/sda3.\n", .status = 1});
    QuietCall(machine, [] {
        int nMd = UNTOUCHED;
        EXPECT_EQ(RAIDDiskSuperblockMdGet("/dev/sda3", &nMd), 0);
        EXPECT_EQ(nMd, UNTOUCHED);
    });

    machine.rows.clear();
    machine.tools["/sbin/mdadm"] = TOOL_KIND::MISSING;
    QuietCall(machine, [] {
        int nMd = UNTOUCHED;
        EXPECT_EQ(RAIDDiskSuperblockMdGet("/dev/sda3", &nMd), 0);
    });
}

TEST(SuperblockMd, FailsForASuperblockThatNamesNoArray)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, "/sbin/mdadm -E /dev/sda3", {.szOut = "        Version : 1.2\n"});
    const RUN_RESULT result = MachineCall(machine, [] {
        int nMd = UNTOUCHED;
        RecordReset();
        errno = EXDEV; // nothing that is called on the way sets it
        EXPECT_EQ(RAIDDiskSuperblockMdGet("/dev/sda3", &nMd), -1);
        EXPECT_EQ(nMd, UNTOUCHED);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
    EXPECT_EQ(LogText(result), "<11>raid_membership.cpp:# Failed to sscanf [], errno=Invalid "
                               "cross-device link\n");
}

TEST(SuperblockMd, RefusesNull)
{
    const RUN_RESULT result = MachineCall(MachineMake(), [] {
        int nMd = UNTOUCHED;
        RecordReset();
        EXPECT_EQ(RAIDDiskSuperblockMdGet(nullptr, &nMd), -1);
        EXPECT_EQ(RAIDDiskSuperblockMdGet("/dev/sda3", nullptr), -1);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
    EXPECT_EQ(LogText(result), "<11>raid_membership.cpp:# Bad parameters\n"
                               "<11>raid_membership.cpp:# Bad parameters\n");
    EXPECT_EQ(TranscriptText(result), "");
}

// ---- whether a disk is taken -------------------------------------------------------------------

RUN_RESULT ExpectUsed(const MACHINE &machine, int nMdExpected)
{
    return MachineCall(machine, [nMdExpected] {
        int nMd = UNTOUCHED;
        EXPECT_EQ(RAIDDiskIsUsedByRAID("/dev/sda", &nMd), 1);
        EXPECT_EQ(nMd, nMdExpected);
    });
}

RUN_RESULT ExpectFree(const MACHINE &machine)
{
    return MachineCall(machine, [] {
        int nMd = UNTOUCHED;
        EXPECT_EQ(RAIDDiskIsUsedByRAID("/dev/sda", &nMd), 0);
        EXPECT_EQ(nMd, UNTOUCHED); // whatever number it found on the way
    });
}

TEST(DiskUsed, IsToldByPartitionThreeAlone)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineDiskAdd(machine, "sda");
    SuperblockExpect(machine, "sda3", 2);
    const RUN_RESULT result = ExpectUsed(machine, 2);
    EXPECT_EQ(TranscriptText(result), "/sbin/mdadm -E /dev/sda3\n");
    EXPECT_EQ(LogText(result), "");
}

TEST(DiskUsed, IsToldByPartitionFiveNext)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineDiskAdd(machine, "sda");
    NoSuperblockExpect(machine, "sda3");
    SuperblockExpect(machine, "sda5", 3);
    const RUN_RESULT result = ExpectUsed(machine, 3);
    EXPECT_EQ(TranscriptText(result), "/sbin/mdadm -E /dev/sda3\n/sbin/mdadm -E /dev/sda5\n");
}

TEST(DiskUsed, NeedNotTellTheNumber)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    SuperblockExpect(machine, "sda3", 2);
    MachineCall(machine, [] { EXPECT_EQ(RAIDDiskIsUsedByRAID("/dev/sda", nullptr), 1); });
}

TEST(DiskUsed, IsNoWithAKnownLayoutAndNoArrayOnItsPartitions)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    PartitionedDiskAdd(machine, "sda", PLACES_6);
    NoSuperblockExpect(machine, "sda3");
    NoSuperblockExpect(machine, "sda5");
    const RUN_RESULT result = ExpectFree(machine);
    EXPECT_EQ(TranscriptText(result), "/sbin/mdadm -E /dev/sda3\n/sbin/mdadm -E /dev/sda5\n");
    EXPECT_EQ(LogText(result), "");
}

struct WHOLE_CASE {
    int nMd;
    bool fUsed;
};

TEST(DiskUsed, TakesWholeDisksFromOneHundredAndOneUp)
{
    constexpr WHOLE_CASE CASES[] = {
        {0, false}, {2, false}, {99, false}, {100, false}, {101, true}, {127, true},
    };
    for (const WHOLE_CASE &row : CASES) {
        SCOPED_TRACE(row.nMd);
        MACHINE machine = MachineWithConf(CONF_RAID);
        PartitionedDiskAdd(machine, "sda", PLACES_FOREIGN);
        NoSuperblockExpect(machine, "sda3");
        NoSuperblockExpect(machine, "sda5");
        SuperblockExpect(machine, "sda", row.nMd);
        const RUN_RESULT result = row.fUsed ? ExpectUsed(machine, row.nMd) : ExpectFree(machine);
        EXPECT_EQ(TranscriptText(result), "/sbin/mdadm -E /dev/sda3\n/sbin/mdadm -E /dev/sda5\n"
                                          "/sbin/mdadm -E /dev/sda\n");
    }
}

TEST(DiskUsed, IsNoWithoutAnySuperblock)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineDiskAdd(machine, "sda");
    for (const char *const szDevice : {"sda3", "sda5", "sda"}) {
        NoSuperblockExpect(machine, szDevice);
    }
    const RUN_RESULT result = ExpectFree(machine);
    EXPECT_EQ(LogText(result), "<15>partition_layout.cpp:# /dev/sda: dont contain partition [1]\n");
}

// The layouts of a machine without RAID are others.
TEST(DiskUsed, AsksForTheLayoutsOfTheModel)
{
    MACHINE machine = MachineWithConf(CONF_NO_RAID);
    PartitionedDiskAdd(machine, "sda", PLACES_3_NO_RAID);
    NoSuperblockExpect(machine, "sda3");
    NoSuperblockExpect(machine, "sda5");
    ExpectFree(machine);

    MachineConf(machine, CONF_RAID);
    SuperblockExpect(machine, "sda", 101);
    ExpectUsed(machine, 101);
}

// A superblock that names no array is no answer, so the next place is asked.
TEST(DiskUsed, GoesOnBehindASuperblockThatNamesNoArray)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineTool(machine, "/sbin/mdadm -E /dev/sda3", {.szOut = "        Version : 1.2\n"});
    SuperblockExpect(machine, "sda5", 4);
    ExpectUsed(machine, 4);
}

// The boot device has no partition names, so only its own superblock can tell.
TEST(DiskUsed, TheBootDeviceIsAskedAsAWhole)
{
    for (const int nMd : {100, 101}) {
        MACHINE machine = MachineWithConf(CONF_RAID);
        SuperblockExpect(machine, "nuroboot", nMd);
        const RUN_RESULT result = MachineCall(machine, [nMd] {
            int nFound = UNTOUCHED;
            EXPECT_EQ(RAIDDiskIsUsedByRAID("/dev/nuroboot", &nFound), nMd >= 101 ? 1 : 0);
            EXPECT_EQ(nFound, nMd >= 101 ? nMd : UNTOUCHED);
        });
        EXPECT_EQ(TranscriptText(result), "/sbin/mdadm -E /dev/nuroboot\n");
    }
}

TEST(DiskUsed, RefusesNull)
{
    const RUN_RESULT result = MachineCall(MachineMake(), [] {
        int nMd = UNTOUCHED;
        EXPECT_QUIET(RAIDDiskIsUsedByRAID(nullptr, &nMd), -1);
        EXPECT_EQ(nMd, UNTOUCHED);
    });
    EXPECT_EQ(LogText(result), "<11>raid_membership.cpp:# Bad parameters\n");
}

// ---- whether an array runs ---------------------------------------------------------------------

void ExpectDetected(const char *szMd, int resultExpected, u32 codeExpected)
{
    EXPECT_FAILS(RAIDIsDetected(szMd), resultExpected, codeExpected);
}

TEST(RaidDetected, IsYesForARunningArray)
{
    MACHINE machine = MachineMake();
    MachineMdAdd(machine, {.nMd = 2});
    QuietCall(machine, [] { ExpectDetected("/dev/md2", 1, OLD_CODE); });
}

TEST(RaidDetected, FailsWithoutANode)
{
    const RUN_RESULT result = MachineCall(MachineMake(), [] {
        ExpectDetected("/dev/md2", -1, ERR_OPEN_FAILED);
        ExpectDetected(nullptr, -1, ERR_BAD_PARAMETER);
    });
    EXPECT_EQ(LogText(result), "<15>raid_membership.cpp:# Failed to open /dev/md2, errno=No such "
                               "file or directory\n");
}

// Kept: an array that is not there is a failure too, because the request reports it as one.
TEST(RaidDetected, FailsWithTheRequest)
{
    MACHINE machine = MachineMake();
    MachineMdAdd(machine, {.nMd = 2, .errnoInfo = ENODEV});
    const RUN_RESULT absent =
        MachineCall(machine, [] { ExpectDetected("/dev/md2", -1, ERR_SYSCALL_FAILED); });
    EXPECT_EQ(LogText(absent),
              "<15>raid_info.cpp:# Failed to ioctl for raid status, errno=No such device\n"
              "<15>raid_membership.cpp:# Failed to ioctl /dev/md2, errno=0X8000\n");

    machine.arrays[0].errnoInfo = EINTR;
    const RUN_RESULT interrupted =
        MachineCall(machine, [] { ExpectDetected("/dev/md2", -1, ERR_INTERRUPTED); });
    EXPECT_EQ(LogText(interrupted),
              "<15>raid_membership.cpp:# Failed to ioctl /dev/md2, errno=0XA700\n");
}

TEST(RaidDetected, ClosesTheArrayOnEveryWayOut)
{
    for (const int error : {0, ENODEV, EINTR}) {
        MACHINE machine = MachineMake();
        MachineMdAdd(machine, {.nMd = 2, .errnoInfo = error});
        MachineCall(machine, [error] {
            openlog(nullptr, LOG_NDELAY, LOG_USER); // so that the log takes no new descriptor
            const int fdBefore = dup(STDIN_FILENO);
            EXPECT_EQ(RAIDIsDetected("/dev/md2"), error == 0 ? 1 : -1);
            EXPECT_EQ(dup(STDIN_FILENO), fdBefore + 1);
        });
    }
}

} // namespace
