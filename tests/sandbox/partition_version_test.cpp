// SPDX-License-Identifier: MIT
#include "nurostoragecore/partition_version.h"

#include "last_error.h"
#include "nurocore/error.h"
#include "nurostoragecore/partition_layout.h"
#include "storage_machine.h"

#include <cerrno>
#include <filesystem>
#include <gtest/gtest.h>
#include <string>
#include <vector>

namespace
{

std::string NotThere(const std::string &szDisk, int partNum)
{
    return "<15>partition_layout.cpp:# " + szDisk + ": dont contain partition [" +
           std::to_string(partNum) + "]\n";
}

std::string Biggest(int version)
{
    return "<11>partition_version.cpp:# Choose biggest partition layout version " +
           std::to_string(version) + ".\n";
}

// Asks in a process of its own, because what the model says is asked once in a process.
RUN_RESULT ExpectVersion(const MACHINE &machine, int fChooseBiggest, u32 versionExpected)
{
    return MachineCall(machine, [fChooseBiggest, versionExpected] {
        u32 version = 0;
        EXPECT_EQ(PartitionLayoutGetMax(&version, fChooseBiggest), 0);
        EXPECT_EQ(version, versionExpected);
    });
}

RUN_RESULT ExpectFirst(const MACHINE &machine, u32 versionExpected)
{
    return MachineCall(machine, [versionExpected] {
        u32 version = 0;
        EXPECT_EQ(PartitionLayoutGet(&version), 0);
        EXPECT_EQ(version, versionExpected);
    });
}

TEST(PartitionVersion, RefusesNull)
{
    QuietCall(MachineMake(), [] {
        RecordReset();
        EXPECT_EQ(PartitionLayoutGetMax(nullptr, 0), -1);
        EXPECT_EQ(PartitionLayoutGetMax(nullptr, 1), -1);
        EXPECT_EQ(PartitionLayoutGet(nullptr), -1);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
}

// ---- a running system array --------------------------------------------------------------------

TEST(PartitionVersion, IsThatOfTheRunningSystemArray)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    PartitionedDiskAdd(machine, "sda", PLACES_2);
    PartitionedDiskAdd(machine, "sdb", PLACES_2);
    PartitionedDiskAdd(machine, "sdc", PLACES_7); // not looked at
    SystemArrayAdd(machine, {{"sda1"}, {"sdb1"}});
    for (const int fChooseBiggest : {0, 1}) {
        const RUN_RESULT result = ExpectVersion(machine, fChooseBiggest, 2);
        EXPECT_EQ(OrderText(result), "");
    }
}

TEST(PartitionVersion, OfTheSystemArrayIsThatOfTheFirstKnownMember)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineDiskAdd(machine, "sda");
    PartitionedDiskAdd(machine, "sdb", PLACES_6);
    MachineDiskAdd(machine, "sdc");
    SystemArrayAdd(machine, {{"sda1"}, {"sdb1"}, {"sdc1"}});
    ExpectVersion(machine, 1, 6);
}

// The first member of a folder as it is read.
std::string FirstMember(const char *szFolder)
{
    for (const auto &entry : std::filesystem::directory_iterator(szFolder)) {
        const std::string szName = entry.path().filename();
        if (szName.rfind("dev-", 0) == 0) {
            return szName;
        }
    }
    return "";
}

// A folder has them in the order of making them or the other way round, so made in both orders the
// later name is the first once.
TEST(PartitionVersion, OfTheSystemArrayIsThatOfTheMemberThatTheFolderHasFirst)
{
    constexpr char FOLDER[] = "/sys/block/md0/md";
    MACHINE machine = MachineWithConf(CONF_RAID);
    PartitionedDiskAdd(machine, "sda", PLACES_6);
    PartitionedDiskAdd(machine, "sdb", PLACES_7);
    MachineFolder(machine, FOLDER);
    const std::vector<std::string> orders[] = {{"dev-sda1", "dev-sdb1"}, {"dev-sdb1", "dev-sda1"}};
    std::string szFirsts;
    for (const std::vector<std::string> &order : orders) {
        const RUN_RESULT result = MachineCall(machine, [&order, &FOLDER] {
            for (const std::string &szName : order) {
                std::filesystem::create_directory(FOLDER + ("/" + szName));
            }
            u32 version = 0;
            EXPECT_EQ(PartitionLayoutGet(&version), 0);
            const std::string szFirst = FirstMember(FOLDER);
            EXPECT_EQ(version, szFirst == "dev-sda1" ? 6U : 7U);
            printf("%s ", szFirst.c_str());
        });
        szFirsts += result.szOut;
    }
    EXPECT_NE(szFirsts.find("dev-sdb1"), std::string::npos) << szFirsts;
}

TEST(PartitionVersion, OfTheSystemArrayIsAlwaysThatOfARaidMachine)
{
    MACHINE machine = MachineWithConf(CONF_NO_RAID);
    PartitionedDiskAdd(machine, "sda", PLACES_3_NO_RAID);
    SystemArrayAdd(machine, {{"sda1"}});
    EXPECT_EQ(LogText(ExpectVersion(machine, 1, 8)), "");

    MACHINE machineKnown = MachineWithConf(CONF_NO_RAID);
    PartitionedDiskAdd(machineKnown, "sda", PLACES_1);
    SystemArrayAdd(machineKnown, {{"sda1"}});
    EXPECT_EQ(LogText(ExpectVersion(machineKnown, 1, 1)), "");
}

TEST(PartitionVersion, IsTheNewestWhenNoMemberIsKnown)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    PartitionedDiskAdd(machine, "sda", PLACES_FOREIGN);
    PartitionedDiskAdd(machine, "sdb", PLACES_7); // no member
    SystemArrayAdd(machine, {{"sda1"}});
    const RUN_RESULT result = ExpectVersion(machine, 1, 8);
    EXPECT_EQ(OrderText(result), "");
}

TEST(PartitionVersion, TakesAMembersNameWithoutItsLastCharacter)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    SystemArrayAdd(machine, {{"sda10"}});
    EXPECT_EQ(LogText(ExpectVersion(machine, 1, 8)), NotThere("sda1", 1));

    MACHINE machineDash = MachineWithConf(CONF_RAID);
    SystemArrayAdd(machineDash, {{"dm-01"}});
    EXPECT_EQ(LogText(ExpectVersion(machineDash, 1, 8)), NotThere("0", 1));
}

TEST(PartitionVersion, LooksAtTheDisksWhenTheSystemArrayHasNoMember)
{
    MACHINE machine = MachineWithConf(CONF_NO_RAID);
    PartitionedDiskAdd(machine, "sda", PLACES_7);
    SystemArrayAdd(machine, {});
    ExpectFirst(machine, 7);
}

TEST(PartitionVersion, FailsWhenTheMembersCannotBeRead)
{
    MACHINE machine = MachineWithConf(CONF_NO_RAID);
    PartitionedDiskAdd(machine, "sda", PLACES_7);
    machine.faults = {{.szFunction = "glob", .nCall = 1, .error = EIO}};
    const RUN_RESULT result = QuietCall(machine, [] {
        u32 version = 0;
        EXPECT_EQ(PartitionLayoutGetMax(&version, 1), -1);
        EXPECT_EQ(version, 0U);
    });
    EXPECT_EQ(TranscriptText(result), "fault glob 1\n");
}

// ---- no system array ---------------------------------------------------------------------------

TEST(PartitionVersion, IsTheNewestOnABlankMachine)
{
    for (const int fChooseBiggest : {0, 1}) {
        const MACHINE machine = MachineWithConf(CONF_RAID);
        EXPECT_EQ(LogText(ExpectVersion(machine, fChooseBiggest, 8)), "");

        MACHINE machineDisks = machine;
        MachineDiskAdd(machineDisks, "sda");
        MachineDiskAdd(machineDisks, "sdb");
        MachinePartitionAdd(machineDisks, "sdb", 1, PLACES_7.start, PLACES_7.size);
        PartitionedDiskAdd(machineDisks, "sdc", PLACES_FOREIGN);
        const RUN_RESULT result = ExpectVersion(machineDisks, fChooseBiggest, 8);
        EXPECT_EQ(LogText(result), NotThere("/dev/sda", 1) + NotThere("/dev/sdb", 2));
        EXPECT_EQ(TranscriptText(result), "");
    }
}

TEST(PartitionVersion, IsThatOfTheFirstDiskOrTheBiggest)
{
    MACHINE machine = MachineWithConf(CONF_NO_RAID);
    PartitionedDiskAdd(machine, "sda", PLACES_6);
    PartitionedDiskAdd(machine, "sdb", PLACES_7);
    PartitionedDiskAdd(machine, "sdc", PLACES_3_NO_RAID);
    const RUN_RESULT first = ExpectFirst(machine, 6);
    EXPECT_EQ(OrderText(first), "");
    const RUN_RESULT biggest = ExpectVersion(machine, 1, 7);
    EXPECT_EQ(LogText(biggest), Biggest(7));
    EXPECT_EQ(TranscriptText(biggest), "");
}

TEST(PartitionVersion, LogsTheBiggestOfOneDiskToo)
{
    MACHINE machine = MachineWithConf(CONF_NO_RAID);
    PartitionedDiskAdd(machine, "sdb", PLACES_2);
    EXPECT_EQ(LogText(ExpectVersion(machine, 1, 2)), Biggest(2));
}

TEST(PartitionVersion, LeavesOtherPortsOut)
{
    MACHINE machine = MachineWithConf(CONF_NO_RAID);
    PartitionedDiskAdd(machine, "sdb", PLACES_6);
    PartitionedDiskAdd(machine, "sde", PLACES_7); // USB
    PartitionedDiskAdd(machine, "sdg", PLACES_7); // eSATA
    EXPECT_EQ(LogText(ExpectVersion(machine, 1, 6)), Biggest(6));
}

TEST(PartitionVersion, KnowsABuiltInStorageAsSeven)
{
    MACHINE machine = MachineWithConf(CONF_BUILDIN);
    PartitionedDiskAdd(machine, "sda", PLACES_BUILDIN);
    EXPECT_EQ(LogText(ExpectVersion(machine, 1, 7)), Biggest(7));
    ExpectFirst(machine, 7);
}

// Before the disks are looked for: the code that stands in the end is that of a port's key.
TEST(PartitionVersion, AsksForRaidBeforeTheDisks)
{
    // Such a value is no yes, and too long to be looked at.
    MACHINE machine = MachineWithConf("supportraid=perhaps\nsupport_dual_head=no\n"
                                      "support_buildin_storage=no\nusbportcfg=0x30\n"
                                      "internalportcfg=0xf\n");
    MachineDiskAdd(machine, "sda");
    MachineCall(machine, [] {
        u32 version = 0;
        EXPECT_EQ(PartitionLayoutGet(&version), 0);
        EXPECT_EQ(version, 8U);
        EXPECT_EQ(NLIBCErrGet(), ERR_KEY_NOT_FOUND);
        EXPECT_QUIET(IsSupportRaid(), 0); // it was asked above
    });
    MachineCall(machine, [] {
        EXPECT_EQ(IsSupportRaid(), 0);
        EXPECT_EQ(NLIBCErrGet(), ERR_BUF_TOO_SMALL);
    });
}

// ---- on a RAID machine the disk has to hold data -----------------------------------------------

struct ARRAY_CASE {
    int nMd;
    u32 version;
};

TEST(PartitionVersion, CountsMembersOfArraysUpToNinetyNine)
{
    constexpr ARRAY_CASE CASES[] = {{0, 6}, {2, 6}, {99, 6}, {100, 8}, {101, 8}, {127, 8}};
    for (const ARRAY_CASE &row : CASES) {
        SCOPED_TRACE(row.nMd);
        MACHINE machine = MachineWithConf(CONF_RAID);
        PartitionedDiskAdd(machine, "sda", PLACES_6);
        SuperblockExpect(machine, "sda3", row.nMd);
        const RUN_RESULT first = ExpectFirst(machine, row.version);
        EXPECT_EQ(LogText(first), "");
        EXPECT_EQ(TranscriptText(first), "/sbin/mdadm -E /dev/sda3\n");
        const RUN_RESULT biggest = ExpectVersion(machine, 1, row.version);
        EXPECT_EQ(LogText(biggest), row.version == 6 ? Biggest(6) : "");
    }
}

TEST(PartitionVersion, CountsADiskWithItsArrayOnPartitionFive)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    PartitionedDiskAdd(machine, "sda", PLACES_7);
    NoSuperblockExpect(machine, "sda3");
    SuperblockExpect(machine, "sda5", 3);
    const RUN_RESULT result = ExpectFirst(machine, 7);
    EXPECT_EQ(TranscriptText(result), "/sbin/mdadm -E /dev/sda3\n/sbin/mdadm -E /dev/sda5\n");
}

TEST(PartitionVersion, ForgetsADiskThatDoesNotCount)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    PartitionedDiskAdd(machine, "sda", PLACES_6);
    NoSuperblockExpect(machine, "sda3");
    NoSuperblockExpect(machine, "sda5");
    for (const int fChooseBiggest : {0, 1}) {
        const RUN_RESULT result = ExpectVersion(machine, fChooseBiggest, 8);
        EXPECT_EQ(LogText(result), "");
        EXPECT_EQ(TranscriptText(result), "/sbin/mdadm -E /dev/sda3\n/sbin/mdadm -E /dev/sda5\n");
    }

    PartitionedDiskAdd(machine, "sdb", PLACES_7);
    SuperblockExpect(machine, "sdb3", 2);
    EXPECT_EQ(TranscriptText(ExpectFirst(machine, 7)),
              "/sbin/mdadm -E /dev/sda3\n/sbin/mdadm -E /dev/sda5\n/sbin/mdadm -E /dev/sdb3\n");
    EXPECT_EQ(LogText(ExpectVersion(machine, 1, 7)), Biggest(7));
}

TEST(PartitionVersion, KeepsTheBiggestWhateverTheOrder)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    PartitionedDiskAdd(machine, "sda", PLACES_2);
    PartitionedDiskAdd(machine, "sdb", PLACES_8);
    PartitionedDiskAdd(machine, "sdc", PLACES_6);
    for (const char *const szDevice : {"sda3", "sdb3", "sdc3"}) {
        SuperblockExpect(machine, szDevice, 2);
    }
    const RUN_RESULT result = ExpectVersion(machine, 1, 8);
    EXPECT_EQ(LogText(result), Biggest(8));
    EXPECT_EQ(TranscriptText(result), "/sbin/mdadm -E /dev/sda3\n/sbin/mdadm -E /dev/sdb3\n"
                                      "/sbin/mdadm -E /dev/sdc3\n");
}

TEST(PartitionVersion, StopsAtTheFirstDiskUnlessTheBiggestIsWanted)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    PartitionedDiskAdd(machine, "sda", PLACES_2);
    PartitionedDiskAdd(machine, "sdb", PLACES_8);
    SuperblockExpect(machine, "sda3", 2);
    EXPECT_EQ(TranscriptText(ExpectFirst(machine, 2)), "/sbin/mdadm -E /dev/sda3\n");
}

// ---- dual-head machines ------------------------------------------------------------------------

TEST(PartitionVersion, OfADualHeadMachineIsThatOfItsExpansionUnits)
{
    MACHINE machine = MachineWithConf(CONF_NO_RAID + "support_dual_head=yes\n");
    PartitionedDiskAdd(machine, "sda", PLACES_8);
    PartitionedDiskAdd(machine, "sdga", PLACES_6);
    PartitionedDiskAdd(machine, "sdgb", PLACES_7);
    ExpansionUnitAdd(machine, "host6", "/dev/sdga,/dev/sdgb");
    ExpectFirst(machine, 6);
    EXPECT_EQ(LogText(ExpectVersion(machine, 1, 7)), Biggest(7));
}

// ---- failures ----------------------------------------------------------------------------------

TEST(PartitionVersion, FailsWhenTheDisksCannotBeEnumerated)
{
    MACHINE machine = MachineWithConf(CONF_NO_RAID);
    PartitionedDiskAdd(machine, "sda", PLACES_7);
    machine.faults = {{.szFunction = "glob", .nCall = 2, .error = EIO}};
    const RUN_RESULT result = MachineCall(machine, [] {
        u32 version = 0;
        EXPECT_EQ(PartitionLayoutGetMax(&version, 1), -1);
        EXPECT_EQ(version, 0U);
    });
    EXPECT_EQ(LogText(result), "<11>disk_port.cpp:# read error :/sys/block/sd*\n");
}

// Whichever call it is that asks for the list's memory.
TEST(PartitionVersion, FailsWithoutMemoryForTheList)
{
    bool fSeen = false;
    for (const char *const szFunction : {"malloc", "calloc"}) {
        for (int nCall = 1; nCall <= 12 && !fSeen; nCall++) {
            MACHINE machine = MachineWithConf(CONF_NO_RAID);
            MachineDiskAdd(machine, "sda");
            machine.faults = {{.szFunction = szFunction, .nCall = nCall}};
            const RUN_RESULT result = MachineCall(machine, [] {
                u32 version = 0;
                RecordReset();
                const int answer = PartitionLayoutGetMax(&version, 1);
                printf("%d %X", answer, NLIBCErrGet());
            });
            fSeen = result.szOut == "-1 200";
        }
    }
    EXPECT_TRUE(fSeen);
}

TEST(PartitionVersion, AMemberWithoutANameIsNoDisk)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineFolder(machine, "/sys/block/md0/md/dev-");
    const RUN_RESULT result = MachineCall(machine, [] {
        u32 version = 0;
        EXPECT_EQ(PartitionLayoutGetMax(&version, 1), 0);
        EXPECT_EQ(version, 8U);
    });
    EXPECT_EQ(LogText(result), "<15>partition_layout.cpp:# : dont contain partition [1]\n");
}

// Only a version that is still none becomes the newest.
TEST(PartitionVersion, AVersionThatTheCallerHasStaysWhereNoMemberIsKnown)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    PartitionedDiskAdd(machine, "sda", PLACES_FOREIGN);
    SystemArrayAdd(machine, {{"sda1"}});
    MachineCall(machine, [] {
        u32 version = 5;
        EXPECT_EQ(PartitionLayoutGetMax(&version, 1), 0);
        EXPECT_EQ(version, 5U);
    });
}

} // namespace
