// SPDX-License-Identifier: MIT
#include "storage_machine.h"

#include <cerrno>
#include <csignal>
#include <gtest/gtest.h>
#include <string>
#include <vector>

namespace
{

const std::vector<std::string> ABCD = {"sda", "sdb", "sdc", "sdd"};

constexpr char NO_DISK[] =
    "<11>arrayctl.cpp:# No disk to create system and swap partition, initsys fail!\n";
constexpr char NO_TYPE[] = "<11>arrayctl.cpp:# Failed to get format type\n";

constexpr SYSTEM_PARTITIONS MADE_7 = {.szStart = "-j256"};
constexpr SYSTEM_PARTITIONS MADE_6 = {
    .szStart = "-j63", .szSize = "-z4980087", .szSwapSize = "-z4192965"};
constexpr SYSTEM_PARTITIONS MADE_1 = {
    .szStart = "-j63", .szSize = "-z1574307", .szSwapSize = "-z787185"};
constexpr SYSTEM_PARTITIONS MADE_NO_RAID = {.szType = "-t83", .szSwapType = "-t82"};
constexpr SYSTEM_PARTITIONS MADE_BUILDIN = {.szStart = "-j256",
                                            .szSize = "-z2097152",
                                            .szSwapSize = "-z5105569",
                                            .szType = "-t83",
                                            .szSwapType = "-t82"};

// A disk with its partitions renewed: what is decided for it and what is done.
void BlankDiskWipe(MACHINE &machine, const std::string &szDisk)
{
    BlankDiskAdd(machine, szDisk);
    RenewExpect(machine, szDisk, RANGE_ALL);
}

void KnownDiskRenew(MACHINE &machine, const std::string &szDisk, const DISK_PLACES &places,
                    const std::string &szRange, const SYSTEM_PARTITIONS &made = {})
{
    DecidedDiskAdd(machine, szDisk, places);
    RenewExpect(machine, szDisk, szRange, made);
}

// The two arrays as the tool's own tools see them: a disk on its own is forced, the slots that are
// left are missing.
std::vector<std::string> ArrayCommands(const std::vector<std::string> &disks, size_t nSlot = 4)
{
    std::vector<std::string> commands;
    for (const int nMd : {0, 1}) {
        std::string szCommand = "/sbin/mdadm -C /dev/md" + std::to_string(nMd) +
                                " -e 0.9 -amd -R -l1 " + (disks.size() == 1 ? "-f " : "") + "-n" +
                                std::to_string(nSlot);
        for (const std::string &szDisk : disks) {
            szCommand += " /dev/" + szDisk + std::to_string(nMd + 1);
        }
        for (size_t i = disks.size(); i < nSlot; i++) {
            szCommand += " missing";
        }
        commands.push_back(szCommand);
    }
    return commands;
}

void CommandsExpect(MACHINE &machine, const std::vector<std::string> &commands)
{
    for (const std::string &szCommand : commands) {
        MachineTool(machine, szCommand);
    }
}

void ArraysExpect(MACHINE &machine, const std::vector<std::string> &disks, size_t nSlot = 4)
{
    CommandsExpect(machine, ArrayCommands(disks, nSlot));
}

// Each array is waited for before it is made.
std::string WithPauses(const std::vector<std::string> &commands)
{
    std::string szText;
    for (const std::string &szCommand : commands) {
        szText += "sleep 3\n" + szCommand + "\n";
    }
    return szText;
}

std::string Inited(const std::string &szSystem, const std::string &szSwap)
{
    return "<11>arrayctl.cpp:# system inited on [" + szSystem + "], [" + szSwap + "]\n";
}

std::string DecideText(const std::string &szDisk)
{
    return ListingCommand(szDisk, 1) + "\n" + ListingCommand(szDisk, 2) + "\n";
}

std::string DecideAndRenewText(const std::string &szDisk, const std::string &szRange,
                               const SYSTEM_PARTITIONS &made = {})
{
    return DecideText(szDisk) + Lines(RenewCommands(szDisk, szRange, made));
}

// ---- blank disks -------------------------------------------------------------------------------

TEST(Initsys, MakesFourBlankDisksTheSystem)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    for (const std::string &szDisk : ABCD) {
        BlankDiskWipe(machine, szDisk);
    }
    const std::vector<std::string> arrays = ArrayCommands(ABCD);
    CommandsExpect(machine, arrays);
    ShellWatch(machine);

    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0, "");
    for (const std::string &szDisk : ABCD) {
        EXPECT_EQ(CommandsOn(result, szDisk), DecideAndRenewText(szDisk, RANGE_ALL));
    }
    EXPECT_EQ(CommandsBeside(result, ABCD), WithPauses(arrays));
    EXPECT_EQ(ShellText(),
              "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1  -n4 /dev/sda1 /dev/sdb1 /dev/sdc1 "
              "/dev/sdd1  > /dev/null 2>&1\n"
              "/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1  -n4 /dev/sda2 /dev/sdb2 /dev/sdc2 "
              "/dev/sdd2  > /dev/null 2>&1\n");
    EXPECT_EQ(LogErrors(result), Inited("/dev/sda1 /dev/sdb1 /dev/sdc1 /dev/sdd1 ",
                                        "/dev/sda2 /dev/sdb2 /dev/sdc2 /dev/sdd2 "));
}

TEST(Initsys, FillsTheSlotsWithMissing)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    BlankDiskWipe(machine, "sda");
    BlankDiskWipe(machine, "sdb");
    ArraysExpect(machine, {"sda", "sdb"});
    ShellWatch(machine);
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(ShellText(), "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1  -n4 /dev/sda1 /dev/sdb1   "
                           "missing missing> /dev/null 2>&1\n"
                           "/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1  -n4 /dev/sda2 /dev/sdb2   "
                           "missing missing> /dev/null 2>&1\n");
    EXPECT_EQ(LogErrors(result), Inited("/dev/sda1 /dev/sdb1 ", "/dev/sda2 /dev/sdb2 "));
}

TEST(Initsys, ForcesArraysOfOneDisk)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    BlankDiskWipe(machine, "sdc");
    ArraysExpect(machine, {"sdc"});
    ShellWatch(machine);
    RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(ShellText(), "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1 -f -n4 /dev/sdc1   "
                           "missing missing missing> /dev/null 2>&1\n"
                           "/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1 -f -n4 /dev/sdc2   "
                           "missing missing missing> /dev/null 2>&1\n");
}

TEST(Initsys, LeavesOtherPortsAlone)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    BlankDiskWipe(machine, "sda");
    for (const char *const szOther : {"sde", "sdg", "sdh", "mmcblk0", "nuroboot"}) {
        MachineDiskAdd(machine, szOther); // USB, eSATA, none, card, boot
    }
    ArraysExpect(machine, {"sda"});
    RunEnds(machine, {"initsys"}, 0);
}

TEST(Initsys, IgnoresFurtherArguments)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    BlankDiskWipe(machine, "sda");
    ArraysExpect(machine, {"sda"});
    RunEnds(machine, {"initsys", "anything", "else"}, 0, "");
}

TEST(Initsys, FailsWithoutADisk)
{
    const MACHINE machine = MachineWithConf(CONF_RAID);
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 1, "");
    EXPECT_EQ(LogText(result), NO_DISK);
    EXPECT_EQ(TranscriptText(result), "");
}

// ---- slots -------------------------------------------------------------------------------------

std::string ConfWithSlots(const std::string &szSlots)
{
    return std::string(CONF_RAID) + "max_sys_raid_disks=" + szSlots + "\n";
}

TEST(InitsysSlots, AreWonByTheFirstDisks)
{
    MACHINE machine = MachineWithConf(ConfWithSlots("2"));
    for (const char *const szDisk : {"sda", "sdb", "sdc"}) {
        BlankDiskWipe(machine, szDisk);
    }
    MachineTool(machine, "/sbin/mdadm --zero-superblock /dev/sdc1");
    MachineTool(machine, "/sbin/mdadm --zero-superblock /dev/sdc2");
    const std::vector<std::string> arrays = ArrayCommands({"sda", "sdb"}, 2);
    CommandsExpect(machine, arrays);
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(CommandsOn(result, "sdc"), DecideAndRenewText("sdc", RANGE_ALL) +
                                             "/sbin/mdadm --zero-superblock /dev/sdc1\n"
                                             "/sbin/mdadm --zero-superblock /dev/sdc2\n");
    EXPECT_EQ(CommandsBeside(result, ABCD), WithPauses(arrays));
    EXPECT_EQ(LogErrors(result), Inited("/dev/sda1 /dev/sdb1 ", "/dev/sda2 /dev/sdb2 "));
}

TEST(InitsysSlots, AreOneForOneForcedDisk)
{
    MACHINE machine = MachineWithConf(ConfWithSlots("1"));
    BlankDiskWipe(machine, "sda");
    BlankDiskWipe(machine, "sdb");
    // Whether the wipe works is no matter.
    MachineTool(machine, "/sbin/mdadm --zero-superblock /dev/sdb1", {.status = 1});
    MachineTool(machine, "/sbin/mdadm --zero-superblock /dev/sdb2", {.status = 1});
    ArraysExpect(machine, {"sda"}, 1);
    RunEnds(machine, {"initsys"}, 0);
}

TEST(InitsysSlots, OfNoneTakeNoDisk)
{
    constexpr char NO_MAXDISKS[] =
        "<11>conf.cpp:# Failed to NLIBCFileGetKeyValue(/etc.defaults/nuroinfo.conf,maxdisks)\n";
    const std::string szWithoutKey = "usbportcfg=0x30\ninternalportcfg=0xf\nsupportraid=yes\n";
    for (const std::string &szConf : {ConfWithSlots("0"), ConfWithSlots("-1"), szWithoutKey}) {
        SCOPED_TRACE(szConf);
        MACHINE machine = MachineWithConf(szConf);
        BlankDiskWipe(machine, "sda");
        MachineTool(machine, "/sbin/mdadm --zero-superblock /dev/sda1");
        MachineTool(machine, "/sbin/mdadm --zero-superblock /dev/sda2");
        const RUN_RESULT result = RunEnds(machine, {"initsys"}, 1);
        EXPECT_EQ(CommandsOn(result, "sda"), DecideAndRenewText("sda", RANGE_ALL) +
                                                 "/sbin/mdadm --zero-superblock /dev/sda1\n"
                                                 "/sbin/mdadm --zero-superblock /dev/sda2\n");
        EXPECT_EQ(CommandsBeside(result, ABCD), "");
        EXPECT_EQ(LogErrors(result),
                  (szConf == szWithoutKey ? NO_MAXDISKS : "") + std::string(NO_DISK));
    }
}

TEST(InitsysSlots, PreferTheirOwnKey)
{
    MACHINE machine = MachineWithConf(ConfWithSlots("\"3\""));
    BlankDiskWipe(machine, "sda");
    BlankDiskWipe(machine, "sdb");
    ArraysExpect(machine, {"sda", "sdb"}, 3);
    RunEnds(machine, {"initsys"}, 0);
}

// 31 words of eight characters and seven of the next: 255.
TEST(InitsysSlots, AreCutWhereTheTextOfMissingEnds)
{
    MACHINE machine = MachineWithConf(ConfWithSlots("40"));
    BlankDiskWipe(machine, "sda");
    std::string szMissing;
    for (int i = 0; i < 31; i++) {
        szMissing += " missing";
    }
    szMissing += " missin";
    ASSERT_EQ(szMissing.size(), 255U);
    MachineTool(machine, "/sbin/mdadm -C ...", {.nTimes = 2});
    ShellWatch(machine);
    RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(ShellText(), "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1 -f -n40 /dev/sda1  " +
                               szMissing + "> /dev/null 2>&1\n" +
                               "/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1 -f -n40 /dev/sda2  " +
                               szMissing + "> /dev/null 2>&1\n");
}

// The number is looked up before the wanted layout: so the log has it.
TEST(InitsysSlots, AreCountedBeforeTheLayoutIsChosen)
{
    MACHINE machine = MachineWithConf("usbportcfg=0x30\ninternalportcfg=0xf\nsupportraid=no\n");
    MachineFile(machine, "/.force_clean_all_disk", "");
    PartitionedDiskAdd(machine, "sda", PLACES_8);
    RenewExpect(machine, "sda", RANGE_ALL, MADE_NO_RAID);
    MachineTool(machine, "/sbin/mdadm --zero-superblock /dev/sda1");
    MachineTool(machine, "/sbin/mdadm --zero-superblock /dev/sda2");
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 1);
    EXPECT_EQ(
        LogErrors(result),
        "<11>conf.cpp:# Failed to NLIBCFileGetKeyValue(/etc.defaults/nuroinfo.conf,maxdisks)\n"
        "<11>partition_version.cpp:# Choose biggest partition layout version 8.\n" +
            std::string(NO_DISK));
}

// ---- what is decided for a disk ----------------------------------------------------------------

TEST(InitsysDecides, ToKeepTheDataOfADiskOfTheWantedLayout)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    KnownDiskRenew(machine, "sda", PLACES_8, RANGE_SYSTEM);
    SuperblockExpect(machine, "sda3", 2); // for the wanted layout; the disk itself is not asked
    ArraysExpect(machine, {"sda"});
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(CommandsOn(result, "sda"),
              "/sbin/mdadm -E /dev/sda3\n" + DecideAndRenewText("sda", RANGE_SYSTEM));
    EXPECT_EQ(LogErrors(result),
              "<11>partition_version.cpp:# Choose biggest partition layout version 8.\n" +
                  Inited("/dev/sda1 ", "/dev/sda2 "));
}

TEST(InitsysDecides, ToUpgradeSevenToEightWithItsData)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    KnownDiskRenew(machine, "sda", PLACES_7, RANGE_SYSTEM);
    NoSuperblockExpect(machine, "sda3");
    NoSuperblockExpect(machine, "sda5");
    ArraysExpect(machine, {"sda"});
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(CommandsOn(result, "sda"), "/sbin/mdadm -E /dev/sda3\n/sbin/mdadm -E /dev/sda5\n" +
                                             DecideAndRenewText("sda", RANGE_SYSTEM));
}

struct STAY_CASE {
    DISK_PLACES places;
    SYSTEM_PARTITIONS made;
};

// An old layout that holds data is the wanted one, on new disks too.
TEST(InitsysDecides, ToStayWithTheLayoutOfTheData)
{
    for (const STAY_CASE &row : {STAY_CASE{PLACES_7, MADE_7}, STAY_CASE{PLACES_6, MADE_6}}) {
        MACHINE machine = MachineWithConf(CONF_RAID);
        KnownDiskRenew(machine, "sda", row.places, RANGE_SYSTEM, row.made);
        SuperblockExpect(machine, "sda3", 2);
        BlankDiskAdd(machine, "sdb");
        RenewExpect(machine, "sdb", RANGE_ALL, row.made);
        ArraysExpect(machine, {"sda", "sdb"});
        RunEnds(machine, {"initsys"}, 0);
    }
}

TEST(InitsysDecides, ToWipeAnOlderLayoutWithoutArray)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    KnownDiskRenew(machine, "sda", PLACES_6, RANGE_ALL);
    NoSuperblockExpect(machine, "sda3", 2); // for the wanted layout, and to decide
    NoSuperblockExpect(machine, "sda5", 2);
    ArraysExpect(machine, {"sda"});
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    const std::string szAsked = "/sbin/mdadm -E /dev/sda3\n/sbin/mdadm -E /dev/sda5\n";
    EXPECT_EQ(CommandsOn(result, "sda"),
              szAsked + DecideText("sda") + szAsked + Lines(RenewCommands("sda", RANGE_ALL)));
}

TEST(InitsysDecides, ToSkipAnOlderLayoutWithArray)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    KnownDiskRenew(machine, "sda", PLACES_8, RANGE_SYSTEM);
    SuperblockExpect(machine, "sda3", 2);
    DecidedDiskAdd(machine, "sdb", PLACES_6);
    SuperblockExpect(machine, "sdb3", 2, 2);
    ArraysExpect(machine, {"sda"});
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(CommandsOn(result, "sdb"),
              "/sbin/mdadm -E /dev/sdb3\n" + DecideText("sdb") + "/sbin/mdadm -E /dev/sdb3\n");
    EXPECT_EQ(LogErrors(result),
              "<11>partition_version.cpp:# Choose biggest partition layout version 8.\n" +
                  std::string(NO_TYPE) + Inited("/dev/sda1 ", "/dev/sda2 "));
}

TEST(InitsysDecides, ToWipeAnOlderLayoutWhoseSuperblockNamesNoArray)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    KnownDiskRenew(machine, "sda", PLACES_6, RANGE_ALL);
    MachineTool(machine, "/sbin/mdadm -E /dev/sda3", {.szOut = "Version : 1.2\n", .nTimes = 2});
    NoSuperblockExpect(machine, "sda5", 2);
    ArraysExpect(machine, {"sda"});
    RunEnds(machine, {"initsys"}, 0);
}

// A newer layout than the wanted one is another layout like any.
TEST(InitsysDecides, ToWipeEightWhereSevenIsWanted)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    KnownDiskRenew(machine, "sda", PLACES_7, RANGE_SYSTEM, MADE_7);
    SystemArrayAdd(machine, {{"sda1"}});
    KnownDiskRenew(machine, "sdb", PLACES_8, RANGE_ALL, MADE_7);
    NoSuperblockExpect(machine, "sdb3");
    NoSuperblockExpect(machine, "sdb5");
    ArraysExpect(machine, {"sda", "sdb"});
    RunEnds(machine, {"initsys"}, 0);
}

TEST(InitsysDecides, ToWipeLayoutOneEvenWhereItIsWanted)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    KnownDiskRenew(machine, "sda", PLACES_1, RANGE_ALL, MADE_1);
    SystemArrayAdd(machine, {{"sda1"}});
    ArraysExpect(machine, {"sda"});
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(CommandsOn(result, "sda"), DecideAndRenewText("sda", RANGE_ALL, MADE_1));
}

TEST(InitsysDecides, ToRenewUnrecognisedTablesWhenThereIsNoKnownOne)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    KnownDiskRenew(machine, "sda", PLACES_FOREIGN, RANGE_SYSTEM);
    // One partition alone is no blank disk either.
    MachineDiskAdd(machine, "sdb");
    MachinePartitionAdd(machine, "sdb", 1, 2048, 4980480);
    MachineTool(machine, ListingCommand("sdb", 1), {.szOut = Listing("sdb", 1, 2048, 4980480)});
    MachineTool(machine, ListingCommand("sdb", 2));
    RenewExpect(machine, "sdb", RANGE_SYSTEM);
    MachineDiskAdd(machine, "sdc");
    MachinePartitionAdd(machine, "sdc", 2, 2048, 4980480);
    MachineTool(machine, ListingCommand("sdc", 1));
    MachineTool(machine, ListingCommand("sdc", 2), {.szOut = Listing("sdc", 2, 2048, 4980480)});
    RenewExpect(machine, "sdc", RANGE_SYSTEM);
    BlankDiskWipe(machine, "sdd");
    ArraysExpect(machine, ABCD);
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    for (const char *const szDisk : {"sda", "sdb", "sdc"}) {
        EXPECT_EQ(CommandsOn(result, szDisk), DecideAndRenewText(szDisk, RANGE_SYSTEM));
    }
}

TEST(InitsysDecides, ToLeaveUnrecognisedTablesBesideAKnownOne)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    DecidedDiskAdd(machine, "sda", PLACES_FOREIGN);
    KnownDiskRenew(machine, "sdb", PLACES_8, RANGE_SYSTEM);
    NoSuperblockExpect(machine, "sdb3");
    NoSuperblockExpect(machine, "sdb5");
    BlankDiskWipe(machine, "sdc");
    ArraysExpect(machine, {"sdb", "sdc"});
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(CommandsOn(result, "sda"), DecideText("sda"));
    EXPECT_EQ(LogErrors(result), Inited("/dev/sdb1 /dev/sdc1 ", "/dev/sdb2 /dev/sdc2 "));
}

TEST(InitsysDecides, ToWipeEveryDiskWhereTheMarkerStands)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineFile(machine, "/.force_clean_all_disk", "", 0);
    PartitionedDiskAdd(machine, "sda", PLACES_8);
    SuperblockExpect(machine, "sda3", 2); // for the wanted layout alone
    PartitionedDiskAdd(machine, "sdb", PLACES_6);
    SuperblockExpect(machine, "sdb3", 2);
    PartitionedDiskAdd(machine, "sdc", PLACES_FOREIGN);
    for (const char *const szDisk : {"sda", "sdb", "sdc"}) {
        RenewExpect(machine, szDisk, RANGE_ALL);
    }
    ArraysExpect(machine, {"sda", "sdb", "sdc"});
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(CommandsOn(result, "sdc"), Lines(RenewCommands("sdc", RANGE_ALL)));
    EXPECT_EQ(MachineFileRead("/.force_clean_all_disk"), "");
}

// ---- other machines ----------------------------------------------------------------------------

TEST(InitsysModel, WithoutRaidGivesTheTypesOfPlainPartitions)
{
    MACHINE machine = MachineWithConf(CONF_NO_RAID);
    KnownDiskRenew(machine, "sda", PLACES_8, RANGE_SYSTEM, MADE_NO_RAID);
    BlankDiskAdd(machine, "sdb");
    RenewExpect(machine, "sdb", RANGE_ALL, MADE_NO_RAID);
    ArraysExpect(machine, {"sda", "sdb"});
    RunEnds(machine, {"initsys"}, 0);
}

// What a disk is decided to be is always looked up among the layouts of RAID machines.
TEST(InitsysModel, WithoutRaidDoesNotRecogniseItsOwnOldLayout)
{
    MACHINE machine = MachineWithConf(CONF_NO_RAID);
    KnownDiskRenew(machine, "sda", PLACES_3_NO_RAID, RANGE_SYSTEM,
                   {.szStart = "-j63",
                    .szSize = "-z530082",
                    .szSwapSize = "-z787185",
                    .szType = "-t83",
                    .szSwapType = "-t82"});
    ArraysExpect(machine, {"sda"});
    RunEnds(machine, {"initsys"}, 0);
}

TEST(InitsysModel, WithBuiltInStorageHasItsOwnGeometry)
{
    MACHINE machine = MachineWithConf(CONF_BUILDIN);
    KnownDiskRenew(machine, "sda", PLACES_BUILDIN, RANGE_SYSTEM, MADE_BUILDIN);
    BlankDiskAdd(machine, "sdb");
    RenewExpect(machine, "sdb", RANGE_ALL, MADE_BUILDIN);
    ArraysExpect(machine, {"sda", "sdb"});
    RunEnds(machine, {"initsys"}, 0);
}

TEST(InitsysModel, WithBuiltInStorageAndRaidHasNoLayout)
{
    MACHINE machine = MachineWithConf("maxdisks=4\nsupportraid=yes\nsupport_buildin_storage=yes\n"
                                      "usbportcfg=0x30\ninternalportcfg=0xf\n");
    BlankDiskAdd(machine, "sda");
    MachineTool(machine, "/sbin/sfdisk --fast-delete -1 /dev/sda");
    MachineTool(machine, "/sbin/sfdisk -M1 /dev/sda");
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 1);
    EXPECT_EQ(LogOf(result, "partition_edit.cpp"),
              "<11>partition_edit.cpp:# Failed to get partition layout: version=8\n");
    ASSERT_EQ(result.log.size(), 4U) << LogText(result);
    EXPECT_EQ(result.log[2].szText.rfind("arrayctl.cpp:# Failed to create system partition of "
                                         "/dev/sda, newlayout=8, errno=0x",
                                         0),
              0U)
        << LogText(result);
    EXPECT_EQ(LogText({.log = {result.log[3]}}), NO_DISK);
}

TEST(InitsysModel, WithoutFileKnowsNoDisk)
{
    MACHINE machine = MachineMake();
    MachineDiskAdd(machine, "sda");
    MachineDiskAdd(machine, "sdb");
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 1);
    EXPECT_EQ(TranscriptText(result), "");
    EXPECT_EQ(LogOf(result, "arrayctl.cpp"), NO_DISK);
}

TEST(InitsysModel, WithTwoHeadsTakesTheExpansionUnits)
{
    MACHINE machine = MachineWithConf(CONF_DUAL_HEAD);
    MachineDiskAdd(machine, "sda"); // internal
    BlankDiskWipe(machine, "sdga");
    BlankDiskWipe(machine, "sdgb");
    MachineDiskAdd(machine, "sdgc"); // no unit tells of it
    ExpansionUnitAdd(machine, "host6", "/dev/sdga,/dev/sdgb");
    const std::vector<std::string> disks = {"sdga", "sdgb"};
    const std::vector<std::string> arrays = ArrayCommands(disks);
    CommandsExpect(machine, arrays);
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(CommandsBeside(result, disks), WithPauses(arrays));
    EXPECT_EQ(LogErrors(result), Inited("/dev/sdga1 /dev/sdgb1 ", "/dev/sdga2 /dev/sdgb2 "));
    EXPECT_EQ(MachineFileRead("/tmp/.dualhead"), "");
}

TEST(InitsysModel, WithTwoHeadsIsToldByTheMarkerToo)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineFile(machine, "/tmp/.dualhead", "");
    MachineDiskAdd(machine, "sda");
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 1);
    EXPECT_EQ(LogText(result), NO_DISK);
}

// ---- commands that fail ------------------------------------------------------------------------

std::string Uncreated(const std::string &szDisk, const std::string &szCode)
{
    return "<11>arrayctl.cpp:# Failed to create system partition of /dev/" + szDisk +
           ", newlayout=8, errno=0x" + szCode + "\n";
}

// All keys that are asked are there, so no lookup has left a code before.
TEST(InitsysFails, ForADiskThatCannotBePartitionedAlone)
{
    MACHINE machine = MachineWithConf(std::string(CONF_RAID) + "max_sys_raid_disks=4\n"
                                                               "support_dual_head=no\n"
                                                               "cacheportcfg=0x0\n");
    BlankDiskWipe(machine, "sda");
    BlankDiskAdd(machine, "sdb");
    MachineTool(machine, "/sbin/sfdisk --fast-delete -1 /dev/sdb", {.status = 1}); // no matter
    MachineTool(machine, "/sbin/sfdisk -M1 /dev/sdb", {.nTimes = 2});
    MachineTool(machine, "/sbin/sfdisk -N1 -uS -q -f -j2048 -z4980480 -tfd -F /dev/sdb",
                {.szErr = "too small\n", .status = 1});
    BlankDiskWipe(machine, "sdc");
    ArraysExpect(machine, {"sda", "sdc"});
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(LogErrors(result),
              "<11>partition_edit.cpp:# Failed to partition disk /dev/sdb, err=256\n" +
                  Uncreated("sdb", "0") + Inited("/dev/sda1 /dev/sdc1 ", "/dev/sda2 /dev/sdc2 "));
    const std::string szLog = MachineFileRead("/var/log/space_operation_error.log").value_or("");
    EXPECT_NE(szLog.find(" command=\"/sbin/sfdisk -N1 -uS -q -f -j2048 -z4980480 -tfd -F "
                         "/dev/sdb\" Error=\"too small \"\n"),
              std::string::npos)
        << szLog;
}

TEST(InitsysFails, WithTheCodeThatStands)
{
    // The lookup of the second head finds no such key, and nothing sets a code after it.
    MACHINE machine = MachineWithConf(std::string(CONF_RAID) + "max_sys_raid_disks=4\n");
    BlankDiskAdd(machine, "sda");
    MachineTool(machine, "/sbin/sfdisk --fast-delete -1 /dev/sda");
    MachineTool(machine, "/sbin/sfdisk -M1 /dev/sda", {.status = 1, .nTimes = 2});
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 1);
    const std::string szUnsigned =
        "<11>partition_edit.cpp:# Failed to add ms-dos signature to /dev/sda, err=256\n";
    EXPECT_EQ(LogErrors(result),
              szUnsigned + szUnsigned +
                  "<11>partition_edit.cpp:# Failed to partition disk /dev/sda, err=255\n" +
                  Uncreated("sda", "2000") + NO_DISK);
}

TEST(InitsysFails, WhenEveryChildDoes)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    for (const std::string &szDisk : ABCD) {
        BlankDiskWipe(machine, szDisk);
        machine.rows.back().answer.status = 1; // partition 2
    }
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 1, "");
    EXPECT_EQ(CommandsBeside(result, ABCD), "");
    EXPECT_EQ(LogText({.log = {result.log.back()}}), NO_DISK);
}

TEST(InitsysFails, NotWhenTheArraysDo)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    BlankDiskWipe(machine, "sda");
    BlankDiskWipe(machine, "sdb");
    const std::vector<std::string> arrays = ArrayCommands({"sda", "sdb"});
    CommandsExpect(machine, arrays);
    for (TOOL_ROW &row : machine.rows) {
        if (row.argv[1] == "-C") {
            row.answer = {.szOut = "noise\n", .szErr = "noise\n", .status = 2};
        }
    }
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0, "");
    EXPECT_EQ(CommandsBeside(result, ABCD), WithPauses(arrays));
    EXPECT_EQ(LogErrors(result),
              "<11>arrayctl.cpp:# Failed to create RAID '/dev/md0' on '/dev/sda1 /dev/sdb1 ' \n"
              "<11>arrayctl.cpp:# szCmd=[/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1  -n4 "
              "/dev/sda1 /dev/sdb1   missing missing> /dev/null 2>&1]\n"
              "<11>arrayctl.cpp:# Failed to create RAID '/dev/md1' on '/dev/sda2 /dev/sdb2 ' \n"
              "<11>arrayctl.cpp:# szCmd=[/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1  -n4 "
              "/dev/sda2 /dev/sdb2   missing missing> /dev/null 2>&1]\n" +
                  Inited("/dev/sda1 /dev/sdb1 ", "/dev/sda2 /dev/sdb2 "));
}

TEST(InitsysFails, NotWithoutAShell)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    BlankDiskWipe(machine, "sda");
    machine.faults = {{.szFunction = "system", .nCall = 1, .error = EAGAIN, .fGoOn = true}};
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(CommandsBeside(result, ABCD), "sleep 3\nfault system 1\nsleep 3\nfault system 2\n");
    EXPECT_EQ(LogErrors(result),
              "<11>arrayctl.cpp:# Failed to create RAID '/dev/md0' on '/dev/sda1 ' \n"
              "<11>arrayctl.cpp:# szCmd=[/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1 -f -n4 "
              "/dev/sda1   missing missing missing> /dev/null 2>&1]\n"
              "<11>arrayctl.cpp:# Failed to create RAID '/dev/md1' on '/dev/sda2 ' \n"
              "<11>arrayctl.cpp:# szCmd=[/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1 -f -n4 "
              "/dev/sda2   missing missing missing> /dev/null 2>&1]\n" +
                  Inited("/dev/sda1 ", "/dev/sda2 "));
}

// Its exit status is that of the bits 8 to 15, and a signal stands below them.
TEST(InitsysFails, NotWhenTheShellIsKilled)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    BlankDiskWipe(machine, "sda");
    ShellKill(machine);
    const RUN_RESULT result = RunEnds(machine, {"initsys-dd"}, 0, "");
    EXPECT_EQ(CommandsBeside(result, ABCD), "sleep 3\nsleep 3\n");
    EXPECT_EQ(LogErrors(result), Inited("/dev/sda1 ", "/dev/sda2 "));
}

TEST(InitsysFails, WithoutAPartitionerForEveryDisk)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineDiskAdd(machine, "sda");
    machine.tools["/sbin/sfdisk"] = TOOL_KIND::MISSING;
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 1);
    EXPECT_EQ(LogOf(result, "partition_edit.cpp"),
              "<15>partition_edit.cpp:# Failed to do '/sbin/sfdisk --fast-delete -1 /dev/sda'\n"
              "<11>partition_edit.cpp:# Failed to add ms-dos signature to /dev/sda, err=32512\n"
              "<11>partition_edit.cpp:# Failed to add ms-dos signature to /dev/sda, err=32512\n"
              "<11>partition_edit.cpp:# Failed to partition disk /dev/sda, err=255\n");
}

// ---- calls that fail ---------------------------------------------------------------------------

TEST(InitsysFails, WhenNoLayoutIsFound)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineDiskAdd(machine, "sda");
    machine.faults = {{.szFunction = "glob", .nCall = 1, .error = EIO}};
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 1);
    EXPECT_EQ(LogText(result), "<11>arrayctl.cpp:# Failed to find partition layout\n");
    EXPECT_EQ(TranscriptText(result), "fault glob 1\n");
}

struct ENUM_CASE {
    const char *szConf;
    const char *szDevices;
};

TEST(InitsysFails, WhenTheDisksCannotBeEnumerated)
{
    constexpr ENUM_CASE CASES[] = {{CONF_RAID, "INTERNAL_DEVICE"},
                                   {CONF_DUAL_HEAD, "EUNIT_DEVICE"}};
    for (const ENUM_CASE &row : CASES) {
        MACHINE machine = MachineWithConf(row.szConf);
        machine.faults = {{.szFunction = "glob", .nCall = 3, .error = EIO}};
        const RUN_RESULT result = RunEnds(machine, {"initsys"}, 1);
        EXPECT_EQ(LogText(result), "<11>disk_port.cpp:# read error :/sys/block/sd*\n"
                                   "<11>arrayctl.cpp:# Failed to enum " +
                                       std::string(row.szDevices) + "\n");
    }
}

constexpr char NO_FORK[] = "<11>process.cpp:# fork error, errno=Resource temporarily unavailable\n"
                           "<11>arrayctl.cpp:# Failed to fork.\n";

TEST(InitsysFails, AtOnceWhenNoChildCanBeForked)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineDiskAdd(machine, "sda");
    MachineDiskAdd(machine, "sdb");
    machine.faults = {{.szFunction = "fork", .nCall = 1, .error = EAGAIN}};
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 1);
    EXPECT_EQ(LogErrors(result), NO_FORK);
    EXPECT_EQ(TranscriptText(result), "fault fork 1\n");
}

// Those that decide already are not waited for.
TEST(InitsysFails, AtOnceWhenALaterChildCannotBeForked)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    for (const std::string &szDisk : ABCD) {
        MachineDiskAdd(machine, szDisk);
        MachineTool(machine, ListingCommand(szDisk, 1), {.msDelay = 5000, .nTimes = ANY_TIMES});
        MachineTool(machine, ListingCommand(szDisk, 2), {.msDelay = 5000, .nTimes = ANY_TIMES});
    }
    machine.faults = {{.szFunction = "fork", .nCall = 3, .error = EAGAIN}};
    machine.fMayLeaveChildren = true;
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 1);
    EXPECT_EQ(LogErrors(result), NO_FORK);
    EXPECT_EQ(CommandsOn(result, "sdc"), "");
    EXPECT_LT(result.seconds, 4.0);
}

// With the marker the two that decide start nothing themselves.
TEST(InitsysFails, AtOnceWhenAPartitioningChildCannotBeForked)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineFile(machine, "/.force_clean_all_disk", "");
    MachineDiskAdd(machine, "sda");
    MachineDiskAdd(machine, "sdb");
    machine.faults = {{.szFunction = "fork", .nCall = 3, .error = EAGAIN}};
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 1);
    EXPECT_EQ(LogErrors(result), NO_FORK);
    EXPECT_EQ(TranscriptText(result), "fault fork 3\n");
}

TEST(InitsysFails, ForTheDiskWhoseDecisionCannotBeWaitedFor)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    BlankDiskAdd(machine, "sda");
    BlankDiskWipe(machine, "sdb");
    ArraysExpect(machine, {"sdb"});
    machine.faults = {{.szFunction = "waitpid", .nCall = 1, .error = ECHILD}};
    machine.fMayLeaveChildren = true;
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(LogOf(result, "arrayctl.cpp"),
              "<11>arrayctl.cpp:# Wait pid failed. pid: # disk: sda\n" +
                  Inited("/dev/sdb1 ", "/dev/sdb2 "));
    EXPECT_EQ(CommandsOn(result, "sda"), DecideText("sda"));
}

TEST(InitsysFails, ForTheDiskWhosePartitioningCannotBeWaitedFor)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    BlankDiskWipe(machine, "sda");
    BlankDiskAdd(machine, "sdb");
    for (const std::string &szCommand : RenewCommands("sdb", RANGE_ALL)) {
        MachineTool(machine, szCommand, {.nTimes = ANY_TIMES}); // it may come to its end or not
    }
    ArraysExpect(machine, {"sda"});
    machine.faults = {{.szFunction = "waitpid", .nCall = 4, .error = ECHILD}}; // two have decided
    machine.fMayLeaveChildren = true;
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(LogOf(result, "arrayctl.cpp"),
              "<11>arrayctl.cpp:# Wait pid failed. pid: # disk: sdb\n" +
                  Inited("/dev/sda1 ", "/dev/sda2 "));
}

// Whichever calls they are that ask for memory. The C library's own are among them, and its glob()
// does not survive each of them, so only the runs that end in the message are looked at.
TEST(InitsysFails, WithoutMemory)
{
    constexpr char NO_LIST[] = "<11>arrayctl.cpp:# Out of memeory, failed to allocate memory for "
                               "PNLIBSZLIST via NLIBCSzListAlloc\n";
    constexpr char NO_CHILDREN[] = "<11>arrayctl.cpp:# failed to alloc\n";
    bool fListSeen = false;
    bool fChildrenSeen = false;
    for (const char *const szFunction : {"malloc", "calloc"}) {
        for (int nCall = 1; nCall <= 24; nCall++) {
            MACHINE machine = MachineWithConf(CONF_RAID);
            MachineFile(machine, "/.force_clean_all_disk", "");
            MachineDiskAdd(machine, "sda");
            MachineTool(machine, "/sbin/sfdisk ...", {.nTimes = ANY_TIMES});
            MachineTool(machine, "/sbin/mdadm ...", {.nTimes = ANY_TIMES});
            machine.faults = {{.szFunction = szFunction, .nCall = nCall}};
            const RUN_RESULT result = MachineTry(machine, {"initsys"});
            const std::string szLog = LogOf(result, "arrayctl.cpp");
            if (szLog == NO_LIST || szLog == NO_CHILDREN) {
                EXPECT_EQ(result.status, 1);
                EXPECT_EQ(result.problems, std::vector<std::string>());
            }
            fListSeen = fListSeen || szLog == NO_LIST;
            fChildrenSeen = fChildrenSeen || szLog == NO_CHILDREN;
        }
    }
    EXPECT_TRUE(fListSeen);
    EXPECT_TRUE(fChildrenSeen);
}

// ---- children ----------------------------------------------------------------------------------

TEST(InitsysChildren, WorkSideBySide)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    for (const std::string &szDisk : ABCD) {
        BlankDiskWipe(machine, szDisk);
    }
    for (TOOL_ROW &row : machine.rows) {
        row.answer.msDelay = HasWord(row, "-N1") ? 2000 : 0;
    }
    ArraysExpect(machine, ABCD);
    machine.msBound = 30000;
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_GE(result.seconds, 4.0); // two slow steps: to decide, and to make partition 1
    EXPECT_LT(result.seconds, 8.0); // one after the other it would be sixteen
}

// The disk behind a slow one is done first, but its turn comes later.
TEST(InitsysChildren, AreWaitedForInTheOrderOfTheDisks)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineDiskAdd(machine, "sda");
    MachineTool(machine, ListingCommand("sda", 1), {.signalCaller = SIGKILL, .msDelay = 1000});
    MachineDiskAdd(machine, "sdb");
    MachineTool(machine, ListingCommand("sdb", 1), {.signalCaller = SIGKILL});
    BlankDiskWipe(machine, "sdc");
    ArraysExpect(machine, {"sdc"});
    machine.fMayLeaveChildren = true; // the killing partitioner itself
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(LogOf(result, "arrayctl.cpp"),
              "<11>arrayctl.cpp:# Child exit not normally, pid: # disk: sda\n"
              "<11>arrayctl.cpp:# Child exit not normally, pid: # disk: sdb\n" +
                  Inited("/dev/sdc1 ", "/dev/sdc2 "));
}

TEST(InitsysChildren, CostTheirOwnDiskWhenKilled)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    BlankDiskWipe(machine, "sda");
    BlankDiskAdd(machine, "sdb");
    MachineTool(machine, "/sbin/sfdisk --fast-delete -1 /dev/sdb", {.signalCaller = SIGTERM});
    BlankDiskWipe(machine, "sdc");
    ArraysExpect(machine, {"sda", "sdc"});
    machine.fMayLeaveChildren = true;
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(LogOf(result, "arrayctl.cpp"),
              "<11>arrayctl.cpp:# Child exit not normally, pid: # disk: sdb\n" +
                  Inited("/dev/sda1 /dev/sdc1 ", "/dev/sda2 /dev/sdc2 "));
    EXPECT_EQ(CommandsOn(result, "sdb"),
              DecideText("sdb") + "/sbin/sfdisk --fast-delete -1 /dev/sdb\n");
}

TEST(InitsysChildren, HaveNothingToReadOrToSay)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    BlankDiskWipe(machine, "sda");
    for (TOOL_ROW &row : machine.rows) {
        row.answer.szErr = "noise\n";
    }
    ArraysExpect(machine, {"sda"});
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0, "");
    for (const RUN_EVENT &event : result.events) {
        if (IsOnDisk(event, "sda")) {
            EXPECT_TRUE(event.fNullInput) << event.argv[1];
        }
    }
}

// ---- the duplication tool ----------------------------------------------------------------------

TEST(InitsysDuplicate, HandsThePartitionsOverBeforeTheArrays)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    BlankDiskWipe(machine, "sda");
    BlankDiskWipe(machine, "sdb");
    const std::string szDuplicate = "/bin/nurodd /dev/sda1 /dev/sdb1 /dev/sda2 /dev/sdb2";
    MachineTool(machine, szDuplicate, {.szOut = "noise\n", .szErr = "noise\n"});
    const std::vector<std::string> arrays = ArrayCommands({"sda", "sdb"});
    CommandsExpect(machine, arrays);
    ShellWatch(machine);
    const RUN_RESULT result = RunEnds(machine, {"initsys-dd", "anything"}, 0, "");
    EXPECT_EQ(CommandsBeside(result, ABCD), szDuplicate + "\n" + WithPauses(arrays));
    const std::string szShell = ShellText();
    EXPECT_EQ(szShell.substr(0, szShell.find('\n')),
              "/bin/nurodd /dev/sda1 /dev/sdb1  /dev/sda2 /dev/sdb2  > /dev/null 2>&1");
    EXPECT_EQ(LogErrors(result), Inited("/dev/sda1 /dev/sdb1 ", "/dev/sda2 /dev/sdb2 "));
}

// The disks that are left out are not handed over either.
TEST(InitsysDuplicate, GetsTheMembersAlone)
{
    MACHINE machine = MachineWithConf(ConfWithSlots("1"));
    BlankDiskWipe(machine, "sda");
    BlankDiskWipe(machine, "sdb");
    MachineTool(machine, "/sbin/mdadm --zero-superblock /dev/sdb1");
    MachineTool(machine, "/sbin/mdadm --zero-superblock /dev/sdb2");
    MachineTool(machine, "/bin/nurodd /dev/sda1 /dev/sda2");
    ArraysExpect(machine, {"sda"}, 1);
    RunEnds(machine, {"initsys-dd"}, 0);
}

TEST(InitsysDuplicate, ThatFailsChangesNothing)
{
    for (const int status : {1, 127, 255}) {
        MACHINE machine = MachineWithConf(CONF_RAID);
        BlankDiskWipe(machine, "sda");
        MachineTool(machine, "/bin/nurodd /dev/sda1 /dev/sda2", {.status = status});
        ArraysExpect(machine, {"sda"});
        RunEnds(machine, {"initsys-dd"}, 0, "system init with nurodd failed\n");
    }
}

TEST(InitsysDuplicate, ThatIsMissingIsAFailedOne)
{
    for (const TOOL_KIND kind : {TOOL_KIND::MISSING, TOOL_KIND::NOT_EXECUTABLE}) {
        MACHINE machine = MachineWithConf(CONF_RAID);
        BlankDiskWipe(machine, "sda");
        machine.tools["/bin/nurodd"] = kind;
        ArraysExpect(machine, {"sda"});
        RunEnds(machine, {"initsys-dd"}, 0, "system init with nurodd failed\n");
    }
}

TEST(InitsysDuplicate, WithoutAShellIsAnotherMessage)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    BlankDiskWipe(machine, "sda");
    machine.faults = {{.szFunction = "system", .nCall = 1, .error = EAGAIN}};
    ArraysExpect(machine, {"sda"});
    RunEnds(machine, {"initsys-dd"}, 0, "can not fork to nurodd\n"); // one line only
}

TEST(InitsysDuplicate, RunsWithTwoEmptyListsWhenNoDiskIsThere)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineTool(machine, "/bin/nurodd");
    ShellWatch(machine);
    const RUN_RESULT result = RunEnds(machine, {"initsys-dd"}, 1, "");
    EXPECT_EQ(ShellText(), "/bin/nurodd   > /dev/null 2>&1\n");
    EXPECT_EQ(LogText(result), NO_DISK);

    BlankDiskWipe(machine, "sda");
    machine.rows.back().answer.status = 1;
    RunEnds(machine, {"initsys-dd"}, 1);
    EXPECT_EQ(ShellText(), "/bin/nurodd   > /dev/null 2>&1\n");
}

} // namespace
