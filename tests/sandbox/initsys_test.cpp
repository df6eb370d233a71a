// SPDX-License-Identifier: MIT
#include "storage_machine.h"

#include <cerrno>
#include <csignal>
#include <gtest/gtest.h>
#include <sstream>
#include <string>
#include <vector>

namespace
{

const std::vector<std::string> ABCD = {"sda", "sdb", "sdc", "sdd"};

constexpr char NO_DISK[] =
    "<11>arrayctl.cpp:# No disk to create system and swap partition, initsys fail!\n";
constexpr char NO_TYPE[] = "<11>arrayctl.cpp:# Failed to get format type\n";

// What is done to a disk, @, line by line: all of its partitions go, or the first two.
constexpr char WIPED[] = "/sbin/sfdisk --fast-delete -1 /dev/@\n"
                         "/sbin/sfdisk -M1 /dev/@\n";
constexpr char KEPT[] = "/sbin/sfdisk --fast-delete 1:2 /dev/@\n"
                        "/sbin/sfdisk -M1 /dev/@\n";

// And how partitions 1 and 2 are made then.
constexpr char MADE_8[] = "/sbin/sfdisk -M1 /dev/@\n"
                          "/sbin/sfdisk -N1 -uS -q -f -j2048 -z4980480 -tfd -F /dev/@\n"
                          "/sbin/sfdisk -N2 -uS -q -f -j0 -z4194304 -tfd -F /dev/@\n";
constexpr char MADE_7[] = "/sbin/sfdisk -M1 /dev/@\n"
                          "/sbin/sfdisk -N1 -uS -q -f -j256 -z4980480 -tfd -F /dev/@\n"
                          "/sbin/sfdisk -N2 -uS -q -f -j0 -z4194304 -tfd -F /dev/@\n";
constexpr char MADE_6[] = "/sbin/sfdisk -M1 /dev/@\n"
                          "/sbin/sfdisk -N1 -uS -q -f -j63 -z4980087 -tfd -F /dev/@\n"
                          "/sbin/sfdisk -N2 -uS -q -f -j0 -z4192965 -tfd -F /dev/@\n";
constexpr char MADE_1[] = "/sbin/sfdisk -M1 /dev/@\n"
                          "/sbin/sfdisk -N1 -uS -q -f -j63 -z1574307 -tfd -F /dev/@\n"
                          "/sbin/sfdisk -N2 -uS -q -f -j0 -z787185 -tfd -F /dev/@\n";
constexpr char MADE_3_NO_RAID[] = "/sbin/sfdisk -M1 /dev/@\n"
                                  "/sbin/sfdisk -N1 -uS -q -f -j63 -z530082 -t83 -F /dev/@\n"
                                  "/sbin/sfdisk -N2 -uS -q -f -j0 -z787185 -t82 -F /dev/@\n";
constexpr char MADE_8_NO_RAID[] = "/sbin/sfdisk -M1 /dev/@\n"
                                  "/sbin/sfdisk -N1 -uS -q -f -j2048 -z4980480 -t83 -F /dev/@\n"
                                  "/sbin/sfdisk -N2 -uS -q -f -j0 -z4194304 -t82 -F /dev/@\n";
constexpr char MADE_BUILDIN[] = "/sbin/sfdisk -M1 /dev/@\n"
                                "/sbin/sfdisk -N1 -uS -q -f -j256 -z2097152 -t83 -F /dev/@\n"
                                "/sbin/sfdisk -N2 -uS -q -f -j0 -z5105569 -t82 -F /dev/@\n";
constexpr char ZEROED[] = "/sbin/mdadm --zero-superblock /dev/@1\n"
                          "/sbin/mdadm --zero-superblock /dev/@2\n";
// What is asked to decide.
constexpr char LISTED[] = "/sbin/sfdisk -l -uS -N1 /dev/@\n"
                          "/sbin/sfdisk -l -uS -N2 /dev/@\n";
constexpr char EXAMINED[] = "/sbin/mdadm -E /dev/@3\n"
                            "/sbin/mdadm -E /dev/@5\n";

// The two arrays of these disks; each of them is waited for before it is made.
constexpr char ARRAYS_A[] =
    "sleep 3\n"
    "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1 -f -n4 /dev/sda1 missing missing missing\n"
    "sleep 3\n"
    "/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1 -f -n4 /dev/sda2 missing missing missing\n";
constexpr char ARRAYS_B[] =
    "sleep 3\n"
    "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1 -f -n4 /dev/sdb1 missing missing missing\n"
    "sleep 3\n"
    "/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1 -f -n4 /dev/sdb2 missing missing missing\n";
constexpr char ARRAYS_C[] =
    "sleep 3\n"
    "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1 -f -n4 /dev/sdc1 missing missing missing\n"
    "sleep 3\n"
    "/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1 -f -n4 /dev/sdc2 missing missing missing\n";
constexpr char ARRAYS_AB[] =
    "sleep 3\n"
    "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1 -n4 /dev/sda1 /dev/sdb1 missing missing\n"
    "sleep 3\n"
    "/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1 -n4 /dev/sda2 /dev/sdb2 missing missing\n";
constexpr char ARRAYS_AC[] =
    "sleep 3\n"
    "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1 -n4 /dev/sda1 /dev/sdc1 missing missing\n"
    "sleep 3\n"
    "/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1 -n4 /dev/sda2 /dev/sdc2 missing missing\n";
constexpr char ARRAYS_BC[] =
    "sleep 3\n"
    "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1 -n4 /dev/sdb1 /dev/sdc1 missing missing\n"
    "sleep 3\n"
    "/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1 -n4 /dev/sdb2 /dev/sdc2 missing missing\n";
constexpr char ARRAYS_ABC[] =
    "sleep 3\n"
    "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1 -n4 /dev/sda1 /dev/sdb1 /dev/sdc1 missing\n"
    "sleep 3\n"
    "/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1 -n4 /dev/sda2 /dev/sdb2 /dev/sdc2 missing\n";
constexpr char ARRAYS_ABCD[] =
    "sleep 3\n"
    "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1 -n4 /dev/sda1 /dev/sdb1 /dev/sdc1 /dev/sdd1\n"
    "sleep 3\n"
    "/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1 -n4 /dev/sda2 /dev/sdb2 /dev/sdc2 /dev/sdd2\n";

// The lines of a disk, in its name.
std::string Of(const std::string &szDisk, const std::string &szLines)
{
    std::string szText = szLines;
    for (size_t i = szText.find('@'); i != std::string::npos; i = szText.find('@', i)) {
        szText.replace(i, 1, szDisk);
    }
    return szText;
}

// Each of these commands is run once and succeeds.
void CommandsExpect(MACHINE &machine, const std::string &szLines)
{
    std::istringstream lines(szLines);
    for (std::string szLine; std::getline(lines, szLine);) {
        if (szLine.starts_with('/')) {
            MachineTool(machine, szLine);
        }
    }
}

void DiskExpect(MACHINE &machine, const std::string &szDisk, const std::string &szLines)
{
    CommandsExpect(machine, Of(szDisk, szLines));
}

// A disk with its partitions renewed: what is decided for it and what is done.
void BlankDiskWipe(MACHINE &machine, const std::string &szDisk, const std::string &szMade = MADE_8)
{
    BlankDiskAdd(machine, szDisk);
    DiskExpect(machine, szDisk, WIPED + szMade);
}

void KnownDiskRenew(MACHINE &machine, const std::string &szDisk, const DISK_PLACES &places,
                    const std::string &szLines)
{
    DecidedDiskAdd(machine, szDisk, places);
    DiskExpect(machine, szDisk, szLines);
}

std::string Inited(const std::string &szSystem, const std::string &szSwap)
{
    return "<11>arrayctl.cpp:# system inited on [" + szSystem + "], [" + szSwap + "]\n";
}

// These disks, blank, and these arrays of them.
MACHINE MachineOf(const std::vector<std::string> &disks, const std::string &szArrays,
                  const std::string &szConf = CONF_RAID)
{
    MACHINE machine = MachineWithConf(szConf);
    for (const std::string &szDisk : disks) {
        BlankDiskWipe(machine, szDisk);
    }
    CommandsExpect(machine, szArrays);
    return machine;
}

// ---- blank disks -------------------------------------------------------------------------------

TEST(Initsys, MakesFourBlankDisksTheSystem)
{
    MACHINE machine = MachineOf(ABCD, ARRAYS_ABCD);
    ShellWatch(machine);
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0, "");
    for (const std::string &szDisk : ABCD) {
        EXPECT_EQ(CommandsOn(result, szDisk), Of(szDisk, std::string(LISTED) + WIPED + MADE_8));
    }
    EXPECT_EQ(CommandsBeside(result, ABCD), ARRAYS_ABCD);
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
    MACHINE machine = MachineOf({"sda", "sdb"}, ARRAYS_AB);
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
    MACHINE machine = MachineOf({"sdc"}, ARRAYS_C);
    ShellWatch(machine);
    RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(ShellText(), "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1 -f -n4 /dev/sdc1   "
                           "missing missing missing> /dev/null 2>&1\n"
                           "/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1 -f -n4 /dev/sdc2   "
                           "missing missing missing> /dev/null 2>&1\n");
}

TEST(Initsys, LeavesOtherPortsAndFurtherArgumentsAlone)
{
    MACHINE machine = MachineOf({"sda"}, ARRAYS_A);
    for (const char *const szOther : {"sde", "sdg", "sdh", "mmcblk0", "nuroboot"}) {
        MachineDiskAdd(machine, szOther); // USB, eSATA, none, card, boot
    }
    RunEnds(machine, {"initsys", "anything", "else"}, 0, "");
}

TEST(Initsys, FailsWithoutADisk)
{
    const RUN_RESULT result = RunEnds(MachineWithConf(CONF_RAID), {"initsys"}, 1, "");
    EXPECT_EQ(OrderText(result), NO_DISK);
}

// ---- slots -------------------------------------------------------------------------------------

std::string ConfWithSlots(const std::string &szSlots)
{
    return std::string(CONF_RAID) + "max_sys_raid_disks=" + szSlots + "\n";
}

TEST(InitsysSlots, AreWonByTheFirstDisks)
{
    constexpr char ARRAYS[] =
        "sleep 3\n"
        "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1 -n2 /dev/sda1 /dev/sdb1\n"
        "sleep 3\n"
        "/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1 -n2 /dev/sda2 /dev/sdb2\n";
    MACHINE machine = MachineOf({"sda", "sdb", "sdc"}, ARRAYS, ConfWithSlots("2"));
    DiskExpect(machine, "sdc", ZEROED);
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(CommandsOn(result, "sdc"), Of("sdc", std::string(LISTED) + WIPED + MADE_8 + ZEROED));
    EXPECT_EQ(CommandsBeside(result, ABCD), ARRAYS);
    EXPECT_EQ(LogErrors(result), Inited("/dev/sda1 /dev/sdb1 ", "/dev/sda2 /dev/sdb2 "));
}

constexpr char ARRAYS_OF_ONE[] = "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1 -f -n1 /dev/sda1\n"
                                 "/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1 -f -n1 /dev/sda2\n";

TEST(InitsysSlots, AreOneForOneForcedDisk)
{
    MACHINE machine = MachineOf({"sda", "sdb"}, ARRAYS_OF_ONE, ConfWithSlots("1"));
    // Whether the wipe works is no matter.
    MachineTool(machine, "/sbin/mdadm --zero-superblock /dev/sdb1", {.status = 1});
    MachineTool(machine, "/sbin/mdadm --zero-superblock /dev/sdb2", {.status = 1});
    RunEnds(machine, {"initsys"}, 0);
}

TEST(InitsysSlots, OfNoneTakeNoDisk)
{
    constexpr char NO_MAXDISKS[] =
        "<11>conf.cpp:# Failed to NLIBCFileGetKeyValue(/etc.defaults/nuroinfo.conf,maxdisks)\n";
    const std::string szWithoutKey = "usbportcfg=0x30\ninternalportcfg=0xf\nsupportraid=yes\n";
    for (const std::string &szConf : {ConfWithSlots("0"), ConfWithSlots("-1"), szWithoutKey}) {
        SCOPED_TRACE(szConf);
        MACHINE machine = MachineOf({"sda"}, "", szConf);
        DiskExpect(machine, "sda", ZEROED);
        const RUN_RESULT result = RunEnds(machine, {"initsys"}, 1);
        EXPECT_EQ(CommandsOn(result, "sda"),
                  Of("sda", std::string(LISTED) + WIPED + MADE_8 + ZEROED));
        EXPECT_EQ(CommandsBeside(result, ABCD), "");
        EXPECT_EQ(LogErrors(result),
                  (szConf == szWithoutKey ? NO_MAXDISKS : "") + std::string(NO_DISK));
    }
}

TEST(InitsysSlots, PreferTheirOwnKey)
{
    const MACHINE machine =
        MachineOf({"sda", "sdb"},
                  "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1 -n3 /dev/sda1 /dev/sdb1 missing\n"
                  "/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1 -n3 /dev/sda2 /dev/sdb2 missing\n",
                  ConfWithSlots("\"3\""));
    RunEnds(machine, {"initsys"}, 0);
}

// 31 words of eight characters and seven of the next: 255.
TEST(InitsysSlots, AreCutWhereTheTextOfMissingEnds)
{
    MACHINE machine = MachineOf({"sda"}, "", ConfWithSlots("40"));
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
    DiskExpect(machine, "sda", std::string(WIPED) + MADE_8_NO_RAID + ZEROED);
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 1);
    EXPECT_EQ(
        LogErrors(result),
        "<11>conf.cpp:# Failed to NLIBCFileGetKeyValue(/etc.defaults/nuroinfo.conf,maxdisks)\n"
        "<11>partition_version.cpp:# Choose biggest partition layout version 8.\n" +
            std::string(NO_DISK));
}

// ---- what is decided for a disk ----------------------------------------------------------------

constexpr char BIGGEST_8[] =
    "<11>partition_version.cpp:# Choose biggest partition layout version 8.\n";

// One disk among them: where its partitions lie, what its superblocks say, what is done to it.
struct DECIDED_DISK {
    std::string szDisk;
    const DISK_PLACES *pPlaces;  // none: blank
    std::string szLines;         // after both questions of the partitioner
    std::string szExamined = ""; // before them
    const char *szReport = "";   // of partition 3; partition 5 has none
};

struct DECISION_CASE {
    const char *szName;
    std::vector<DECIDED_DISK> disks;
    const char *szArrays;
    std::string szConf = CONF_RAID;
    bool fSystemArray = false; // of the first disk
    std::string szLog = "";    // before the line that it is done
};

constexpr char OF_MD2[] = "Version : 0.90.00\nUUID : 1:2:3:4\nPreferred Minor : 2\n";
constexpr char OF_NO_ARRAY[] = "Version : 1.2\n";
constexpr char EXAMINED_3[] = "/sbin/mdadm -E /dev/@3\n";

void DecidedDiskExpect(MACHINE &machine, const DECIDED_DISK &disk)
{
    if (disk.pPlaces == nullptr) {
        BlankDiskAdd(machine, disk.szDisk);
    } else {
        DecidedDiskAdd(machine, disk.szDisk, *disk.pPlaces);
    }
    DiskExpect(machine, disk.szDisk, disk.szExamined + disk.szLines);
    for (TOOL_ROW &row : machine.rows) {
        if (row.argv[1] == "-E" && row.argv[2] == "/dev/" + disk.szDisk + "3") {
            row.answer.szOut = disk.szReport;
        }
    }
}

// The last line where these arrays are made.
std::string InitedOf(const std::string &szArrays)
{
    if (szArrays == ARRAYS_A) {
        return Inited("/dev/sda1 ", "/dev/sda2 ");
    }
    return szArrays == ARRAYS_AB ? Inited("/dev/sda1 /dev/sdb1 ", "/dev/sda2 /dev/sdb2 ")
                                 : Inited("/dev/sdb1 /dev/sdc1 ", "/dev/sdb2 /dev/sdc2 ");
}

void ExpectDecision(const DECISION_CASE &row)
{
    SCOPED_TRACE(row.szName);
    MACHINE machine = MachineWithConf(row.szConf);
    for (const DECIDED_DISK &disk : row.disks) {
        DecidedDiskExpect(machine, disk);
    }
    if (row.fSystemArray) {
        SystemArrayAdd(machine, {{row.disks[0].szDisk + "1"}});
    }
    CommandsExpect(machine, row.szArrays);
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0, "");
    for (const DECIDED_DISK &disk : row.disks) {
        EXPECT_EQ(CommandsOn(result, disk.szDisk),
                  Of(disk.szDisk, disk.szExamined + LISTED + disk.szLines));
    }
    EXPECT_EQ(CommandsBeside(result, ABCD), row.szArrays);
    EXPECT_EQ(LogErrors(result), row.szLog + InitedOf(row.szArrays));
}

const std::string KEEP_8 = std::string(KEPT) + MADE_8;
const std::string WIPE_8 = std::string(WIPED) + MADE_8;
const std::string KEEP_7 = std::string(KEPT) + MADE_7;
const std::string WIPE_7 = std::string(WIPED) + MADE_7;

TEST(InitsysDecides, WhatBecomesOfADisk)
{
    const DECISION_CASE cases[] = {
        {"the wanted layout keeps its data, and the disk itself is not asked",
         {{"sda", &PLACES_8, KEEP_8, EXAMINED_3, OF_MD2}},
         ARRAYS_A,
         CONF_RAID,
         false,
         BIGGEST_8},
        {"seven becomes eight with its data", {{"sda", &PLACES_7, KEEP_8, EXAMINED}}, ARRAYS_A},
        // An old layout that holds data is the wanted one, on new disks too.
        {"seven stays",
         {{"sda", &PLACES_7, KEEP_7, EXAMINED_3, OF_MD2}, {"sdb", nullptr, WIPE_7}},
         ARRAYS_AB,
         CONF_RAID,
         false,
         "<11>partition_version.cpp:# Choose biggest partition layout version 7.\n"},
        {"six stays",
         {{"sda", &PLACES_6, std::string(KEPT) + MADE_6, EXAMINED_3, OF_MD2},
          {"sdb", nullptr, std::string(WIPED) + MADE_6}},
         ARRAYS_AB,
         CONF_RAID,
         false,
         "<11>partition_version.cpp:# Choose biggest partition layout version 6.\n"},
        // For the wanted layout, and to decide.
        {"an older layout without array goes",
         {{"sda", &PLACES_6, EXAMINED + WIPE_8, EXAMINED}},
         ARRAYS_A},
        {"an older layout with array is left alone",
         {{"sda", &PLACES_8, KEEP_8, EXAMINED_3, OF_MD2},
          {"sdb", &PLACES_6, EXAMINED_3, EXAMINED_3, OF_MD2}},
         ARRAYS_A,
         CONF_RAID,
         false,
         std::string(BIGGEST_8) + NO_TYPE},
        // A newer layout than the wanted one is another layout like any.
        {"eight goes where seven is wanted",
         {{"sda", &PLACES_7, KEEP_7}, {"sdb", &PLACES_8, EXAMINED + WIPE_7}},
         ARRAYS_AB,
         CONF_RAID,
         true},
        {"layout one goes even where it is wanted",
         {{"sda", &PLACES_1, std::string(WIPED) + MADE_1}},
         ARRAYS_A,
         CONF_RAID,
         true},
        {"an unrecognised table is left alone beside a known one",
         {{"sda", &PLACES_FOREIGN, ""},
          {"sdb", &PLACES_8, KEEP_8, EXAMINED},
          {"sdc", nullptr, WIPE_8}},
         ARRAYS_BC},
        {"without RAID, the types of plain partitions",
         {{"sda", &PLACES_8, std::string(KEPT) + MADE_8_NO_RAID},
          {"sdb", nullptr, std::string(WIPED) + MADE_8_NO_RAID}},
         ARRAYS_AB,
         CONF_NO_RAID,
         false,
         BIGGEST_8},
        // What a disk is decided to be is always looked up among the layouts of RAID machines.
        {"without RAID, its own old layout is not recognised",
         {{"sda", &PLACES_3_NO_RAID, std::string(KEPT) + MADE_3_NO_RAID}},
         ARRAYS_A,
         CONF_NO_RAID,
         false,
         "<11>partition_version.cpp:# Choose biggest partition layout version 3.\n"},
        {"built-in storage has its own geometry",
         {{"sda", &PLACES_BUILDIN, std::string(KEPT) + MADE_BUILDIN},
          {"sdb", nullptr, std::string(WIPED) + MADE_BUILDIN}},
         ARRAYS_AB,
         CONF_BUILDIN,
         false,
         "<11>partition_version.cpp:# Choose biggest partition layout version 7.\n"},
    };
    for (const DECISION_CASE &row : cases) {
        ExpectDecision(row);
    }
}

TEST(InitsysDecides, ToWipeAnOlderLayoutWhoseSuperblockNamesNoArray)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    DecidedDiskExpect(machine, {"sda", &PLACES_6, EXAMINED + WIPE_8, EXAMINED, OF_NO_ARRAY});
    CommandsExpect(machine, ARRAYS_A);
    RunEnds(machine, {"initsys"}, 0);
}

// One partition alone is no blank disk either.
TEST(InitsysDecides, ToRenewUnrecognisedTablesWhenThereIsNoKnownOne)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    KnownDiskRenew(machine, "sda", PLACES_FOREIGN, KEEP_8);
    for (const int nPartition : {1, 2}) {
        const std::string szDisk = nPartition == 1 ? "sdb" : "sdc";
        MachineDiskAdd(machine, szDisk);
        MachinePartitionAdd(machine, szDisk, nPartition, 2048, 4980480);
        MachineTool(machine, ListingCommand(szDisk, nPartition),
                    {.szOut = Listing(szDisk, nPartition, 2048, 4980480)});
        MachineTool(machine, ListingCommand(szDisk, 3 - nPartition));
        DiskExpect(machine, szDisk, KEEP_8);
    }
    BlankDiskWipe(machine, "sdd");
    CommandsExpect(machine, ARRAYS_ABCD);
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    for (const char *const szDisk : {"sda", "sdb", "sdc"}) {
        EXPECT_EQ(CommandsOn(result, szDisk), Of(szDisk, LISTED + KEEP_8));
    }
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
        DiskExpect(machine, szDisk, WIPE_8);
    }
    CommandsExpect(machine, ARRAYS_ABC);
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(CommandsOn(result, "sdc"), Of("sdc", WIPE_8));
    EXPECT_EQ(MachineFileRead("/.force_clean_all_disk"), "");
}

// ---- other machines ----------------------------------------------------------------------------

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
    constexpr char ARRAYS[] =
        "sleep 3\n"
        "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1 -n4 /dev/sdga1 /dev/sdgb1 missing missing\n"
        "sleep 3\n"
        "/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1 -n4 /dev/sdga2 /dev/sdgb2 missing missing\n";
    CommandsExpect(machine, ARRAYS);
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(CommandsBeside(result, {"sdga", "sdgb"}), ARRAYS);
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
    CommandsExpect(machine, ARRAYS_AC);
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
    MACHINE machine = MachineOf({"sda", "sdb"}, ARRAYS_AB);
    for (TOOL_ROW &row : machine.rows) {
        if (row.argv[1] == "-C") {
            row.answer = {.szOut = "noise\n", .szErr = "noise\n", .status = 2};
        }
    }
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0, "");
    EXPECT_EQ(CommandsBeside(result, ABCD), ARRAYS_AB);
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
        MachineTool(machine, ListingCommand(szDisk, 1), {.nMeet = NEVER, .nTimes = ANY_TIMES});
        MachineTool(machine, ListingCommand(szDisk, 2), {.nMeet = NEVER, .nTimes = ANY_TIMES});
    }
    machine.faults = {{.szFunction = "fork", .nCall = 3, .error = EAGAIN}};
    machine.fMayLeaveChildren = true;
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 1);
    EXPECT_EQ(LogErrors(result), NO_FORK);
    EXPECT_EQ(CommandsOn(result, "sdc"), "");
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
    CommandsExpect(machine, ARRAYS_B);
    machine.faults = {{.szFunction = "waitpid", .nCall = 1, .error = ECHILD}};
    machine.fMayLeaveChildren = true;
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(LogOf(result, "arrayctl.cpp"),
              "<11>arrayctl.cpp:# Wait pid failed. pid: # disk: sda\n" +
                  Inited("/dev/sdb1 ", "/dev/sdb2 "));
    EXPECT_EQ(CommandsOn(result, "sda"), Of("sda", LISTED));
}

TEST(InitsysFails, ForTheDiskWhosePartitioningCannotBeWaitedFor)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    BlankDiskWipe(machine, "sda");
    BlankDiskAdd(machine, "sdb");
    DiskExpect(machine, "sdb", WIPE_8);
    for (TOOL_ROW &row : machine.rows) {
        const bool fRenews = row.argv.back() == "/dev/sdb" && row.argv[1] != "-l";
        row.answer.nTimes = fRenews ? ANY_TIMES : 1; // it may come to its end or not
    }
    CommandsExpect(machine, ARRAYS_A);
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
    MACHINE machine = MachineOf(ABCD, "");
    for (TOOL_ROW &row : machine.rows) {
        row.answer.nMeet = !HasWord(row, "-N1") ? 0 : HasWord(row, "-l") ? 4 : 8;
    }
    CommandsExpect(machine, ARRAYS_ABCD);
    (void)RunEnds(machine, {"initsys"}, 0);
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
    CommandsExpect(machine, ARRAYS_C);
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
    CommandsExpect(machine, ARRAYS_AC);
    machine.fMayLeaveChildren = true;
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(LogOf(result, "arrayctl.cpp"),
              "<11>arrayctl.cpp:# Child exit not normally, pid: # disk: sdb\n" +
                  Inited("/dev/sda1 /dev/sdc1 ", "/dev/sda2 /dev/sdc2 "));
    EXPECT_EQ(CommandsOn(result, "sdb"),
              Of("sdb", LISTED) + "/sbin/sfdisk --fast-delete -1 /dev/sdb\n");
}

TEST(InitsysChildren, HaveNothingToReadOrToSay)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    BlankDiskWipe(machine, "sda");
    for (TOOL_ROW &row : machine.rows) {
        row.answer.szErr = "noise\n";
    }
    CommandsExpect(machine, ARRAYS_A);
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
    CommandsExpect(machine, ARRAYS_AB);
    ShellWatch(machine);
    const RUN_RESULT result = RunEnds(machine, {"initsys-dd", "anything"}, 0, "");
    EXPECT_EQ(CommandsBeside(result, ABCD), szDuplicate + "\n" + ARRAYS_AB);
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
    CommandsExpect(machine, ARRAYS_OF_ONE);
    RunEnds(machine, {"initsys-dd"}, 0);
}

TEST(InitsysDuplicate, ThatFailsChangesNothing)
{
    for (const int status : {1, 127, 255}) {
        MACHINE machine = MachineWithConf(CONF_RAID);
        BlankDiskWipe(machine, "sda");
        MachineTool(machine, "/bin/nurodd /dev/sda1 /dev/sda2", {.status = status});
        CommandsExpect(machine, ARRAYS_A);
        RunEnds(machine, {"initsys-dd"}, 0, "system init with nurodd failed\n");
    }
}

TEST(InitsysDuplicate, ThatIsMissingIsAFailedOne)
{
    for (const TOOL_KIND kind : {TOOL_KIND::MISSING, TOOL_KIND::NOT_EXECUTABLE}) {
        MACHINE machine = MachineWithConf(CONF_RAID);
        BlankDiskWipe(machine, "sda");
        machine.tools["/bin/nurodd"] = kind;
        CommandsExpect(machine, ARRAYS_A);
        RunEnds(machine, {"initsys-dd"}, 0, "system init with nurodd failed\n");
    }
}

TEST(InitsysDuplicate, WithoutAShellIsAnotherMessage)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    BlankDiskWipe(machine, "sda");
    machine.faults = {{.szFunction = "system", .nCall = 1, .error = EAGAIN}};
    CommandsExpect(machine, ARRAYS_A);
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
