// SPDX-License-Identifier: MIT
#include "storage_machine.h"

#include <cerrno>
#include <csignal>
#include <gtest/gtest.h>
#include <ostream>
#include <string>
#include <vector>

namespace
{

const std::vector<std::string> ABCD = {"sda", "sdb", "sdc", "sdd"};

const STEPS NO_DISK = {
    {"<11>arrayctl.cpp:# No disk to create system and swap partition, initsys fail!"}};
const STEPS NO_MAXDISKS = {
    {"<11>conf.cpp:# Failed to NLIBCFileGetKeyValue(/etc.defaults/nuroinfo.conf,maxdisks)"}};
const STEPS NO_FORK = {{"<11>process.cpp:# fork error, errno=Resource temporarily unavailable"},
                       {"<11>arrayctl.cpp:# Failed to fork."}};
constexpr char FORCE_MARKER[] = "/.force_clean_all_disk";

const STEPS LISTED = Listed(BLANK);
const STEPS WIPED = Cleaned(RANGE_ALL);
const STEPS KEPT = Cleaned(RANGE_SYSTEM);
const STEPS ZEROED = {{"/sbin/mdadm --zero-superblock /dev/@1"},
                      {"/sbin/mdadm --zero-superblock /dev/@2"}};
// A blank disk that becomes one of the newest layout.
const STEPS BLANK_8 = LISTED + WIPED + MADE_8;

// The two arrays; each of them is waited for before it is made.
STEPS ArraysOf(const std::string &szSystem, const std::string &szSwap,
               const TOOL_ANSWER &answer = {})
{
    return {{"sleep 3"},
            {"/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1 " + szSystem, answer},
            {"sleep 3"},
            {"/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1 " + szSwap, answer}};
}

const STEPS ARRAYS_A = ArraysOf("-f -n4 /dev/sda1 missing missing missing",
                                "-f -n4 /dev/sda2 missing missing missing");
const STEPS ARRAYS_B = ArraysOf("-f -n4 /dev/sdb1 missing missing missing",
                                "-f -n4 /dev/sdb2 missing missing missing");
const STEPS ARRAYS_C = ArraysOf("-f -n4 /dev/sdc1 missing missing missing",
                                "-f -n4 /dev/sdc2 missing missing missing");
const STEPS ARRAYS_AB =
    ArraysOf("-n4 /dev/sda1 /dev/sdb1 missing missing", "-n4 /dev/sda2 /dev/sdb2 missing missing");
const STEPS ARRAYS_AC =
    ArraysOf("-n4 /dev/sda1 /dev/sdc1 missing missing", "-n4 /dev/sda2 /dev/sdc2 missing missing");
const STEPS ARRAYS_BC =
    ArraysOf("-n4 /dev/sdb1 /dev/sdc1 missing missing", "-n4 /dev/sdb2 /dev/sdc2 missing missing");
const STEPS ARRAYS_ABC = ArraysOf("-n4 /dev/sda1 /dev/sdb1 /dev/sdc1 missing",
                                  "-n4 /dev/sda2 /dev/sdb2 /dev/sdc2 missing");
const STEPS ARRAYS_ABCD = ArraysOf("-n4 /dev/sda1 /dev/sdb1 /dev/sdc1 /dev/sdd1",
                                   "-n4 /dev/sda2 /dev/sdb2 /dev/sdc2 /dev/sdd2");
const STEPS ARRAYS_OF_ONE_SLOT = ArraysOf("-f -n1 /dev/sda1", "-f -n1 /dev/sda2");

STEPS Inited(const std::string &szSystem, const std::string &szSwap)
{
    return {{"<11>arrayctl.cpp:# system inited on [" + szSystem + "], [" + szSwap + "]"}};
}

const STEPS INITED_A = Inited("/dev/sda1 ", "/dev/sda2 ");
const STEPS INITED_B = Inited("/dev/sdb1 ", "/dev/sdb2 ");
const STEPS INITED_C = Inited("/dev/sdc1 ", "/dev/sdc2 ");
const STEPS INITED_AB = Inited("/dev/sda1 /dev/sdb1 ", "/dev/sda2 /dev/sdb2 ");
const STEPS INITED_AC = Inited("/dev/sda1 /dev/sdc1 ", "/dev/sda2 /dev/sdc2 ");
const STEPS INITED_BC = Inited("/dev/sdb1 /dev/sdc1 ", "/dev/sdb2 /dev/sdc2 ");
const STEPS INITED_ABC = Inited("/dev/sda1 /dev/sdb1 /dev/sdc1 ", "/dev/sda2 /dev/sdb2 /dev/sdc2 ");
const STEPS INITED_ABCD =
    Inited("/dev/sda1 /dev/sdb1 /dev/sdc1 /dev/sdd1 ", "/dev/sda2 /dev/sdb2 /dev/sdc2 /dev/sdd2 ");

STEPS Biggest(int version)
{
    return {{"<11>partition_version.cpp:# Choose biggest partition layout version " +
             std::to_string(version) + "."}};
}

// ---- slots -------------------------------------------------------------------------------------

MACHINE MachineWithSlots(const std::string &szSlots)
{
    return MachineWithConf(CONF_RAID + "max_sys_raid_disks=" + szSlots + "\n");
}

constexpr char CONF_NO_SLOTS[] = "usbportcfg=0x30\ninternalportcfg=0xf\nsupportraid=yes\n";

// 31 words of eight characters and seven of the next: 255.
std::string MissingCut()
{
    std::string szMissing;
    for (int i = 0; i < 31; i++) {
        szMissing += " missing";
    }
    return szMissing + " missin";
}

struct Initsys : testing::TestWithParam<DISKS_CASE> {
};

TEST_P(Initsys, Does)
{
    ExpectDisks(GetParam());
}

const DISKS_CASE DISK_CASES[] = {
    {.szName = "MakesFourBlankDisksTheSystem",
     .disks = OnEach(ABCD, BLANK_8),
     .beside = ARRAYS_ABCD,
     .errors = INITED_ABCD,
     .szShell = "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1  -n4 /dev/sda1 /dev/sdb1 /dev/sdc1 "
                "/dev/sdd1  > /dev/null 2>&1\n"
                "/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1  -n4 /dev/sda2 /dev/sdb2 /dev/sdc2 "
                "/dev/sdd2  > /dev/null 2>&1\n"},
    {.szName = "FillsTheSlotsWithMissing",
     .disks = OnEach({"sda", "sdb"}, BLANK_8),
     .beside = ARRAYS_AB,
     .errors = INITED_AB,
     .szShell = "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1  -n4 /dev/sda1 /dev/sdb1   "
                "missing missing> /dev/null 2>&1\n"
                "/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1  -n4 /dev/sda2 /dev/sdb2   "
                "missing missing> /dev/null 2>&1\n"},
    {.szName = "ForcesArraysOfOneDisk",
     .disks = {{"sdc", BLANK_8}},
     .beside = ARRAYS_C,
     .errors = INITED_C,
     .szShell = "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1 -f -n4 /dev/sdc1   "
                "missing missing missing> /dev/null 2>&1\n"
                "/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1 -f -n4 /dev/sdc2   "
                "missing missing missing> /dev/null 2>&1\n"},
    // USB, eSATA, none, card, boot
    {.szName = "LeavesOtherPortsAndFurtherArgumentsAlone",
     .disks = {{"sda", BLANK_8}},
     .beside = ARRAYS_A,
     .errors = INITED_A,
     .machine = MachineOfDisks(
         {{"sde", BLANK}, {"sdg", BLANK}, {"sdh", BLANK}, {"mmcblk0", BLANK}, {"nuroboot", BLANK}}),
     .arguments = {"initsys", "anything", "else"}},
    {.szName = "SlotsAreWonByTheFirstDisks",
     .disks = {{"sda", BLANK_8}, {"sdb", BLANK_8}, {"sdc", BLANK_8 + ZEROED}},
     .beside = ArraysOf("-n2 /dev/sda1 /dev/sdb1", "-n2 /dev/sda2 /dev/sdb2"),
     .errors = INITED_AB,
     .machine = MachineWithSlots("2")},
    // Whether the wipe works is no matter.
    {.szName = "OneSlotIsOneForcedDisks",
     .disks = {{"sda", BLANK_8},
               {"sdb", BLANK_8 + STEPS{{ZEROED[0].szText, {.status = 1}},
                                       {ZEROED[1].szText, {.status = 1}}}}},
     .beside = ARRAYS_OF_ONE_SLOT,
     .errors = INITED_A,
     .machine = MachineWithSlots("1")},
    {.szName = "NoSlotsTakeNoDisk",
     .disks = {{"sda", BLANK_8 + ZEROED}},
     .errors = NO_DISK,
     .machine = MachineWithSlots("0"),
     .status = 1},
    {.szName = "LessThanNoSlotsTakeNoDisk",
     .disks = {{"sda", BLANK_8 + ZEROED}},
     .errors = NO_DISK,
     .machine = MachineWithSlots("-1"),
     .status = 1},
    {.szName = "SlotsThatNobodyTellsTakeNoDisk",
     .disks = {{"sda", BLANK_8 + ZEROED}},
     .errors = NO_MAXDISKS + NO_DISK,
     .machine = MachineWithConf(CONF_NO_SLOTS),
     .status = 1},
    {.szName = "SlotsPreferTheirOwnKey",
     .disks = OnEach({"sda", "sdb"}, BLANK_8),
     .beside = ArraysOf("-n3 /dev/sda1 /dev/sdb1 missing", "-n3 /dev/sda2 /dev/sdb2 missing"),
     .errors = INITED_AB,
     .machine = MachineWithSlots("\"3\"")},
    {.szName = "SlotsAreCutWhereTheTextOfMissingEnds",
     .disks = {{"sda", BLANK_8}},
     .beside = ArraysOf("-f -n40 /dev/sda1" + MissingCut(), "-f -n40 /dev/sda2" + MissingCut()),
     .errors = INITED_A,
     .machine = MachineWithSlots("40"),
     .szShell = "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1 -f -n40 /dev/sda1  " + MissingCut() +
                "> /dev/null 2>&1\n/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1 -f -n40 /dev/sda2  " +
                MissingCut() + "> /dev/null 2>&1\n"},
    // So the log has it.
    {.szName = "SlotsAreCountedBeforeTheLayoutIsChosen",
     .disks = {{"sda", WIPED + MADE_8_NO_RAID + ZEROED}},
     .errors = NO_MAXDISKS + Biggest(8) + NO_DISK,
     .machine = WithFile(MachineOfDisks({{"sda", PLACES_8}}, "usbportcfg=0x30\nsupportraid=no\n"
                                                             "internalportcfg=0xf\n"),
                         FORCE_MARKER, ""),
     .status = 1},
};

INSTANTIATE_TEST_SUITE_P(Slots, Initsys, testing::ValuesIn(DISK_CASES), ROW_NAME());

// ---- what is decided for a disk ----------------------------------------------------------------

const STEPS NO_TYPE = {{"<11>arrayctl.cpp:# Failed to get format type"}};

// What partition 3 says; partition 5 has no superblock.
STEPS ExaminedOf(const std::string &szReport)
{
    return {{"/sbin/mdadm -E /dev/@3", {.szOut = szReport}}};
}

const STEPS EXAMINED_MD2 = ExaminedOf(Examination(2));
const STEPS EXAMINED = ExaminedOf("") + STEPS{{"/sbin/mdadm -E /dev/@5"}};
const STEPS EXAMINED_NO_ARRAY = ExaminedOf("Version : 1.2\n") + STEPS{{"/sbin/mdadm -E /dev/@5"}};

const DISKS_CASE DECISION_CASES[] = {
    // And the disk itself is not asked.
    {.szName = "TheWantedLayoutKeepsItsData",
     .disks = {{"sda", EXAMINED_MD2 + Listed(PLACES_8) + KEPT + MADE_8}},
     .beside = ARRAYS_A,
     .errors = Biggest(8) + INITED_A,
     .machine = MachineOfDisks({{"sda", PLACES_8}})},
    {.szName = "SevenBecomesEightWithItsData",
     .disks = {{"sda", EXAMINED + Listed(PLACES_7) + KEPT + MADE_8}},
     .beside = ARRAYS_A,
     .errors = INITED_A,
     .machine = MachineOfDisks({{"sda", PLACES_7}})},
    // An old layout that holds data is the wanted one, on new disks too.
    {.szName = "SevenStays",
     .disks = {{"sda", EXAMINED_MD2 + Listed(PLACES_7) + KEPT + MADE_7},
               {"sdb", LISTED + WIPED + MADE_7}},
     .beside = ARRAYS_AB,
     .errors = Biggest(7) + INITED_AB,
     .machine = MachineOfDisks({{"sda", PLACES_7}})},
    {.szName = "SixStays",
     .disks = {{"sda", EXAMINED_MD2 + Listed(PLACES_6) + KEPT + MADE_6},
               {"sdb", LISTED + WIPED + MADE_6}},
     .beside = ARRAYS_AB,
     .errors = Biggest(6) + INITED_AB,
     .machine = MachineOfDisks({{"sda", PLACES_6}})},
    // Examined for the wanted layout, and to decide.
    {.szName = "AnOlderLayoutWithoutArrayGoes",
     .disks = {{"sda", EXAMINED + Listed(PLACES_6) + EXAMINED + WIPED + MADE_8}},
     .beside = ARRAYS_A,
     .errors = INITED_A,
     .machine = MachineOfDisks({{"sda", PLACES_6}})},
    {.szName = "AnOlderLayoutWhoseSuperblockNamesNoArrayGoes",
     .disks = {{"sda", EXAMINED_NO_ARRAY + Listed(PLACES_6) + EXAMINED_NO_ARRAY + WIPED + MADE_8}},
     .beside = ARRAYS_A,
     .errors = 2 * STEPS{{"<11>raid_membership.cpp:# Failed to sscanf [], errno=No such file or "
                          "directory"}} +
               INITED_A,
     .machine = MachineOfDisks({{"sda", PLACES_6}})},
    {.szName = "AnOlderLayoutWithArrayIsLeftAlone",
     .disks = {{"sda", EXAMINED_MD2 + Listed(PLACES_8) + KEPT + MADE_8},
               {"sdb", EXAMINED_MD2 + Listed(PLACES_6) + EXAMINED_MD2}},
     .beside = ARRAYS_A,
     .errors = Biggest(8) + NO_TYPE + INITED_A,
     .machine = MachineOfDisks({{"sda", PLACES_8}, {"sdb", PLACES_6}})},
    // A newer layout than the wanted one is another layout like any.
    {.szName = "EightGoesWhereSevenIsWanted",
     .disks = {{"sda", Listed(PLACES_7) + KEPT + MADE_7},
               {"sdb", Listed(PLACES_8) + EXAMINED + WIPED + MADE_7}},
     .beside = ARRAYS_AB,
     .errors = INITED_AB,
     .machine = With(MachineOfDisks({{"sda", PLACES_7}, {"sdb", PLACES_8}}),
                     [](MACHINE &machine) { SystemArrayAdd(machine, {{"sda1"}}); })},
    {.szName = "LayoutOneGoesEvenWhereItIsWanted",
     .disks = {{"sda", Listed(PLACES_1) + WIPED + MADE_1}},
     .beside = ARRAYS_A,
     .errors = INITED_A,
     .machine = With(MachineOfDisks({{"sda", PLACES_1}}),
                     [](MACHINE &machine) { SystemArrayAdd(machine, {{"sda1"}}); })},
    {.szName = "AnUnrecognisedTableIsLeftAloneBesideAKnownOne",
     .disks = {{"sda", Listed(PLACES_FOREIGN)},
               {"sdb", EXAMINED + Listed(PLACES_8) + KEPT + MADE_8},
               {"sdc", BLANK_8}},
     .beside = ARRAYS_BC,
     .errors = INITED_BC,
     .machine = MachineOfDisks({{"sda", PLACES_FOREIGN}, {"sdb", PLACES_8}})},
    {.szName = "PartitionsArePlainWithoutRaid",
     .disks = {{"sda", Listed(PLACES_8) + KEPT + MADE_8_NO_RAID},
               {"sdb", LISTED + WIPED + MADE_8_NO_RAID}},
     .beside = ARRAYS_AB,
     .errors = Biggest(8) + INITED_AB,
     .machine = MachineOfDisks({{"sda", PLACES_8}}, CONF_NO_RAID)},
    // What a disk is decided to be is always looked up among the layouts of RAID machines.
    {.szName = "ItsOwnOldLayoutIsNotRecognisedWithoutRaid",
     .disks = {{"sda", Listed(PLACES_3_NO_RAID) + KEPT + MADE_3_NO_RAID}},
     .beside = ARRAYS_A,
     .errors = Biggest(3) + INITED_A,
     .machine = MachineOfDisks({{"sda", PLACES_3_NO_RAID}}, CONF_NO_RAID)},
    {.szName = "ABuiltInStorageHasItsOwnGeometry",
     .disks = {{"sda", Listed(PLACES_BUILDIN) + KEPT + MADE_BUILDIN},
               {"sdb", LISTED + WIPED + MADE_BUILDIN}},
     .beside = ARRAYS_AB,
     .errors = Biggest(7) + INITED_AB,
     .machine = MachineOfDisks({{"sda", PLACES_BUILDIN}}, CONF_BUILDIN)},
    // One partition alone is no blank disk either.
    {.szName = "UnrecognisedTablesAreRenewedWhenThereIsNoKnownOne",
     .disks = {{"sda", Listed(PLACES_FOREIGN) + KEPT + MADE_8},
               {"sdb", Listed({.start = 2048, .size = 4980480}) + KEPT + MADE_8},
               {"sdc", Listed({.swapStart = 2048, .swapSize = 4980480}) + KEPT + MADE_8},
               {"sdd", BLANK_8}},
     .beside = ARRAYS_ABCD,
     .errors = INITED_ABCD,
     .machine = MachineOfDisks({{"sda", PLACES_FOREIGN},
                                {"sdb", {.start = 2048, .size = 4980480}},
                                {"sdc", {.swapStart = 2048, .swapSize = 4980480}}})},
};

INSTANTIATE_TEST_SUITE_P(Decided, Initsys, testing::ValuesIn(DECISION_CASES), ROW_NAME());

// The superblocks are examined for the wanted layout alone.
TEST(InitsysDecides, ToWipeEveryDiskWhereTheMarkerStands)
{
    MACHINE machine =
        MachineOfDisks({{"sda", PLACES_8}, {"sdb", PLACES_6}, {"sdc", PLACES_FOREIGN}});
    MachineFile(machine, FORCE_MARKER, "", 0);
    ExpectDisks({.szName = "marker",
                 .disks = {{"sda", EXAMINED_MD2 + WIPED + MADE_8},
                           {"sdb", EXAMINED_MD2 + WIPED + MADE_8},
                           {"sdc", WIPED + MADE_8}},
                 .beside = ARRAYS_ABC,
                 .errors = Biggest(8) + INITED_ABC,
                 .machine = machine});
    EXPECT_EQ(MachineFileRead(FORCE_MARKER), "");
}

// ---- other machines ----------------------------------------------------------------------------

TEST(InitsysModel, WithTwoHeadsTakesTheExpansionUnits)
{
    MACHINE machine = MachineOfDisks({{"sda", BLANK}, {"sdgc", BLANK}}, CONF_DUAL_HEAD);
    ExpansionUnitAdd(machine, "host6", "/dev/sdga,/dev/sdgb"); // neither sda nor sdgc
    ExpectDisks({.szName = "unit",
                 .disks = OnEach({"sdga", "sdgb"}, BLANK_8),
                 .beside = ArraysOf("-n4 /dev/sdga1 /dev/sdgb1 missing missing",
                                    "-n4 /dev/sdga2 /dev/sdgb2 missing missing"),
                 .errors = Inited("/dev/sdga1 /dev/sdgb1 ", "/dev/sdga2 /dev/sdgb2 "),
                 .machine = machine});
    EXPECT_EQ(MachineFileRead("/tmp/.dualhead"), "");
}

// ---- what fails --------------------------------------------------------------------------------

STEPS Uncreated(const std::string &szDisk, const std::string &szCode)
{
    return {{"<11>arrayctl.cpp:# Failed to create system partition of /dev/" + szDisk +
             ", newlayout=8, errno=0x" + szCode}};
}

STEPS Unsigned(const std::string &szError)
{
    return {
        {"<11>partition_edit.cpp:# Failed to add ms-dos signature to /dev/sda, err=" + szError}};
}

STEPS Unpartitioned(const std::string &szDisk, const std::string &szError)
{
    return {
        {"<11>partition_edit.cpp:# Failed to partition disk /dev/" + szDisk + ", err=" + szError}};
}

STEPS ArrayFailed(const std::string &szMd, const std::string &szMembers,
                  const std::string &szCommand)
{
    return {{"<11>arrayctl.cpp:# Failed to create RAID '" + szMd + "' on '" + szMembers + "' "},
            {"<11>arrayctl.cpp:# szCmd=[/sbin/mdadm -C " + szMd + " -e 0.9 -amd -R -l1 " +
             szCommand + "> /dev/null 2>&1]"}};
}

// A child that does not come to its end leaves its partitioner behind.
MACHINE MachineOfKilled()
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    machine.fMayLeaveChildren = true;
    return machine;
}

constexpr char DUPLICATED_A[] = "/bin/nurodd /dev/sda1 /dev/sda2";

const DISKS_CASE FAILURE_CASES[] = {
    {.szName = "WithoutTheModelsFile",
     .errors = NO_MAXDISKS +
               4 * STEPS{{"<11>disk_port.cpp:# Get usbportcfg key from "
                          "/etc.defaults/nuroinfo.conf Error"}} +
               NO_DISK,
     .machine = Without(MachineOfDisks({{"sda", BLANK}, {"sdb", BLANK}}), "/etc.defaults"),
     .status = 1},
    {.szName = "ABuiltInStorageWithRaidHasNoLayout",
     .disks = {{"sda", LISTED + WIPED}},
     .errors = STEPS{{"<11>partition_edit.cpp:# Failed to get partition layout: version=8"}} +
               Uncreated("sda", "2000") + NO_DISK,
     .machine = MachineWithConf("maxdisks=4\nsupportraid=yes\nsupport_buildin_storage=yes\n"
                                "usbportcfg=0x30\ninternalportcfg=0xf\n"),
     .status = 1},
    // The lookup of the second head finds no such key, and nothing sets a code after it.
    {.szName = "WithTheCodeThatStands",
     .disks = {{"sda",
                LISTED + STEPS{WIPED[0]} + 2 * STEPS{{"/sbin/sfdisk -M1 /dev/@", {.status = 1}}}}},
     .errors =
         2 * Unsigned("256") + Unpartitioned("sda", "255") + Uncreated("sda", "2000") + NO_DISK,
     .machine = MachineWithSlots("4"),
     .status = 1},
    {.szName = "NotWhenTheArraysDo",
     .disks = OnEach({"sda", "sdb"}, BLANK_8),
     .beside = ArraysOf("-n4 /dev/sda1 /dev/sdb1 missing missing",
                        "-n4 /dev/sda2 /dev/sdb2 missing missing",
                        {.szOut = "noise\n", .szErr = "noise\n", .status = 2}),
     .errors = ArrayFailed("/dev/md0", "/dev/sda1 /dev/sdb1 ",
                           " -n4 /dev/sda1 /dev/sdb1   missing missing") +
               ArrayFailed("/dev/md1", "/dev/sda2 /dev/sdb2 ",
                           " -n4 /dev/sda2 /dev/sdb2   missing missing") +
               INITED_AB},
    {.szName = "NotWithoutAShell",
     .disks = {{"sda", BLANK_8}},
     .beside = {{"sleep 3"}, {"fault system 1"}, {"sleep 3"}, {"fault system 2"}},
     .errors = ArrayFailed("/dev/md0", "/dev/sda1 ", "-f -n4 /dev/sda1   missing missing missing") +
               ArrayFailed("/dev/md1", "/dev/sda2 ", "-f -n4 /dev/sda2   missing missing missing") +
               INITED_A,
     .machine = WithFault(MachineWithConf(CONF_RAID),
                          {.szFunction = "system", .error = EAGAIN, .fGoOn = true})},
    // Its exit status is that of the bits 8 to 15, and a signal stands below them.
    {.szName = "NotWhenTheShellIsKilled",
     .disks = {{"sda", BLANK_8}},
     .beside = {{"sleep 3"}, {"sleep 3"}},
     .errors = INITED_A,
     .machine = With(MachineWithConf(CONF_RAID), ShellKill),
     .arguments = {"initsys-dd"}},
    {.szName = "ForTheDiskWhoseDecisionCannotBeWaitedFor",
     .disks = {{"sda", LISTED}, {"sdb", BLANK_8}},
     .beside = STEPS{{"fault waitpid \"1 0 -\""}} + ARRAYS_B,
     .errors = STEPS{{"<11>arrayctl.cpp:# Wait pid failed. pid: # disk: sda"}} + INITED_B,
     .machine = WithFault(MachineOfKilled(),
                          {.szFunction = "waitpid", .error = ECHILD, .szProcess = "0"})},
    // The disk behind a slow one is done first, but its turn comes later.
    {.szName = "ForKilledChildrenInTheOrderOfTheDisks",
     .disks = {{"sda", {{LISTED[0].szText, {.signalCaller = SIGKILL, .msDelay = 1000}}}},
               {"sdb", {{LISTED[0].szText, {.signalCaller = SIGKILL}}}},
               {"sdc", BLANK_8}},
     .beside = ARRAYS_C,
     .errors = STEPS{{"<11>arrayctl.cpp:# Child exit not normally, pid: # disk: sda"},
                     {"<11>arrayctl.cpp:# Child exit not normally, pid: # disk: sdb"}} +
               INITED_C,
     .machine = MachineOfKilled()},
    {.szName = "ForTheDiskWhoseChildIsKilledAlone",
     .disks = {{"sda", BLANK_8},
               {"sdb", LISTED + STEPS{{WIPED[0].szText, {.signalCaller = SIGTERM}}}},
               {"sdc", BLANK_8}},
     .beside = ARRAYS_AC,
     .errors = STEPS{{"<11>arrayctl.cpp:# Child exit not normally, pid: # disk: sdb"}} + INITED_AC,
     .machine = MachineOfKilled()},
};

INSTANTIATE_TEST_SUITE_P(Fails, Initsys, testing::ValuesIn(FAILURE_CASES), ROW_NAME());

// All keys that are asked are there, so no lookup has left a code before.
TEST(InitsysFails, ForADiskThatCannotBePartitionedAlone)
{
    ExpectDisks({.szName = "sdb",
                 .disks = {{"sda", BLANK_8},
                           {"sdb", LISTED + STEPS{{WIPED[0].szText, {.status = 1}}, // no matter
                                                  WIPED[1],
                                                  MADE_8[0],
                                                  {MADE_8[1].szText,
                                                   {.szErr = "too small\n", .status = 1}}}},
                           {"sdc", BLANK_8}},
                 .beside = ARRAYS_AC,
                 .errors = Unpartitioned("sdb", "256") + Uncreated("sdb", "0") + INITED_AC,
                 .machine = MachineWithConf(CONF_RAID + "max_sys_raid_disks=4\n"
                                                        "support_dual_head=no\n"
                                                        "cacheportcfg=0x0\n")});
    const std::string szLog = MachineFileRead("/var/log/space_operation_error.log").value_or("");
    EXPECT_NE(szLog.find(" command=\"/sbin/sfdisk -N1 -uS -q -f -j2048 -z4980480 -tfd -F "
                         "/dev/sdb\" Error=\"too small \"\n"),
              std::string::npos)
        << szLog;
}

MACHINE MachineOfFour(const STEPS &steps)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    for (const std::string &szDisk : ABCD) {
        MachineDiskAdd(machine, szDisk);
        StepsExpect(machine, StepsOn(szDisk, steps));
    }
    return machine;
}

TEST(InitsysFails, WhenEveryChildDoes)
{
    STEPS steps = BLANK_8;
    steps.back().answer.status = 1; // partition 2
    const RUN_RESULT result = RunEnds(MachineOfFour(steps), {"initsys"}, 1, "");
    EXPECT_EQ(CommandsBeside(result, ABCD), "");
    EXPECT_EQ(LogText({.log = {result.log.back()}}), StepsText(NO_DISK));
}

// Those that decide already are not waited for.
TEST(InitsysFails, AtOnceWhenALaterChildCannotBeForked)
{
    STEPS steps = LISTED;
    for (STEP &step : steps) {
        step.answer = {.nMeet = NEVER, .nTimes = ANY_TIMES};
    }
    MACHINE machine =
        WithFault(MachineOfFour(steps), {.szFunction = "fork", .nCall = 3, .error = EAGAIN});
    machine.fMayLeaveChildren = true;
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 1);
    EXPECT_EQ(LogErrors(result), StepsText(NO_FORK));
    EXPECT_EQ(CommandsOn(result, "sdc"), "");
}

TEST(InitsysFails, ForTheDiskWhosePartitioningCannotBeWaitedFor)
{
    MACHINE machine = MachineOfKilled();
    MachineDiskAdd(machine, "sda");
    MachineDiskAdd(machine, "sdb");
    STEPS renewed = WIPED + MADE_8;
    for (STEP &step : renewed) {
        step.answer.nTimes = ANY_TIMES; // it may come to its end or not
    }
    StepsExpect(machine, StepsOn("sda", BLANK_8) + StepsOn("sdb", LISTED + renewed) + ARRAYS_A);
    machine.faults = {{.szFunction = "waitpid", .nCall = 4, .error = ECHILD}}; // two have decided
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(LogOf(result, "arrayctl.cpp"),
              "<11>arrayctl.cpp:# Wait pid failed. pid: # disk: sdb\n" + StepsText(INITED_A));
}

TEST(InitsysFails, WithoutMemory)
{
    MACHINE machine = WithFile(MachineOfDisks({{"sda", BLANK}}), FORCE_MARKER, "");
    MachineTool(machine, "/sbin/sfdisk ...", {.nTimes = ANY_TIMES});
    MachineTool(machine, "/sbin/mdadm ...", {.nTimes = ANY_TIMES});
    EXPECT_GE(RunsWithoutMemory(machine, "initsys", NO_MEMORY_FOR_LIST), 1);
    EXPECT_GE(RunsWithoutMemory(machine, "initsys", "<11>arrayctl.cpp:# failed to alloc\n"), 1);
}

// ---- runs that end early -----------------------------------------------------------------------

struct END_CASE {
    const char *szName;
    MACHINE machine;
    STEPS steps;
    const char *szWord = "initsys";
};

void PrintTo(const END_CASE &row, std::ostream *pStream)
{
    *pStream << row.szName;
}

struct InitsysEnds : testing::TestWithParam<END_CASE> {
};

TEST_P(InitsysEnds, Early)
{
    const END_CASE &row = GetParam();
    ExpectRun({row.szName, row.machine, {row.szWord}, "", 1, row.steps});
}

MACHINE WithGlobFault(const MACHINE &machine, int nCall)
{
    return WithFault(machine, {.szFunction = "glob", .nCall = nCall, .error = EIO});
}

const STEPS TWO_BLANK = {{"<15>partition_layout.cpp:# /dev/sda: dont contain partition [1]"},
                         {"<15>partition_layout.cpp:# /dev/sdb: dont contain partition [1]"}};
const STEPS UNREAD = {{"fault glob 3"}, {"<11>disk_port.cpp:# read error :/sys/block/sd*"}};

const STEPS NO_PARTITIONER = {
    TWO_BLANK[0],
    {"<15>partition_edit.cpp:# Failed to do '/sbin/sfdisk --fast-delete -1 /dev/sda'"}};
const MACHINE ONE_DISK = MachineOfDisks({{"sda", BLANK}});
const MACHINE TWO_DISKS = MachineOfDisks({{"sda", BLANK}, {"sdb", BLANK}});

const END_CASE END_CASES[] = {
    {"WithoutADisk", MachineWithConf(CONF_RAID), NO_DISK},
    {"WithTheMarkerOfTwoHeads", WithFile(ONE_DISK, "/tmp/.dualhead", ""), NO_DISK},
    {"WithoutALayout",
     WithGlobFault(ONE_DISK, 1),
     {{"fault glob 1"}, {"<11>arrayctl.cpp:# Failed to find partition layout"}}},
    {"WithoutTheInternalDisks", WithGlobFault(MachineWithConf(CONF_RAID), 3),
     UNREAD + STEPS{{"<11>arrayctl.cpp:# Failed to enum INTERNAL_DEVICE"}}},
    {"WithoutTheUnitsDisks", WithGlobFault(MachineWithConf(CONF_DUAL_HEAD), 3),
     UNREAD + STEPS{{"<11>arrayctl.cpp:# Failed to enum EUNIT_DEVICE"}}},
    {"WithoutAChild", WithFault(TWO_DISKS, {.szFunction = "fork", .error = EAGAIN}),
     TWO_BLANK + STEPS{{"fault fork 1"}} + NO_FORK},
    // With the marker the two that decide start nothing themselves.
    {"WithoutAPartitioningChild",
     WithFault(WithFile(TWO_DISKS, FORCE_MARKER, ""),
               {.szFunction = "fork", .nCall = 3, .error = EAGAIN}),
     TWO_BLANK + STEPS{{"fault fork 3"}} + NO_FORK},
    {"WithoutAPartitioner", WithTool(ONE_DISK, "/sbin/sfdisk", TOOL_KIND::MISSING),
     NO_PARTITIONER + 2 * Unsigned("32512") + Unpartitioned("sda", "255") +
         Uncreated("sda", "2000") + NO_DISK},
    {"WithTwoEmptyListsForTheDuplicationTool", MachineWithConf(CONF_RAID),
     STEPS{{"/bin/nurodd"}} + NO_DISK, "initsys-dd"},
};

INSTANTIATE_TEST_SUITE_P(, InitsysEnds, testing::ValuesIn(END_CASES), ROW_NAME());

// ---- children ----------------------------------------------------------------------------------

TEST(InitsysChildren, WorkSideBySide)
{
    STEPS steps = BLANK_8;
    steps[0].answer.nMeet = 4; // partition 1 is asked for, and
    steps[5].answer.nMeet = 8; // made
    ExpectDisks({.szName = "four",
                 .disks = OnEach(ABCD, steps),
                 .beside = ARRAYS_ABCD,
                 .errors = INITED_ABCD});
}

TEST(InitsysChildren, HaveNothingToReadOrToSay)
{
    STEPS steps = BLANK_8;
    for (STEP &step : steps) {
        step.answer.szErr = "noise\n";
    }
    const RUN_RESULT result = ExpectDisks(
        {.szName = "one", .disks = {{"sda", steps}}, .beside = ARRAYS_A, .errors = INITED_A});
    for (const RUN_EVENT &event : result.events) {
        if (IsOnDisk(event, "sda")) {
            EXPECT_TRUE(event.fNullInput) << event.argv[1];
        }
    }
}

// ---- the duplication tool ----------------------------------------------------------------------

const DISKS_CASE DUPLICATION_CASES[] = {
    {.szName = "BeforeTheArrays",
     .disks = OnEach({"sda", "sdb"}, BLANK_8),
     .beside = STEPS{{"/bin/nurodd /dev/sda1 /dev/sdb1 /dev/sda2 /dev/sdb2",
                      {.szOut = "noise\n", .szErr = "noise\n"}}} +
               ARRAYS_AB,
     .errors = INITED_AB,
     .arguments = {"initsys-dd", "anything"},
     .szShell = "/bin/nurodd /dev/sda1 /dev/sdb1  /dev/sda2 /dev/sdb2  > /dev/null 2>&1\n"
                "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1  -n4 /dev/sda1 /dev/sdb1   "
                "missing missing> /dev/null 2>&1\n"
                "/sbin/mdadm -C /dev/md1 -e 0.9 -amd -R -l1  -n4 /dev/sda2 /dev/sdb2   "
                "missing missing> /dev/null 2>&1\n"},
    // The disks that are left out are not handed over either.
    {.szName = "TheMembersAlone",
     .disks = {{"sda", BLANK_8}, {"sdb", BLANK_8 + ZEROED}},
     .beside = STEPS{{DUPLICATED_A}} + ARRAYS_OF_ONE_SLOT,
     .errors = INITED_A,
     .machine = MachineWithSlots("1"),
     .arguments = {"initsys-dd"}},
    {.szName = "WithoutAShell", // one line only
     .disks = {{"sda", BLANK_8}},
     .beside = STEPS{{"fault system 1"}} + ARRAYS_A,
     .errors = INITED_A,
     .machine = WithFault(MachineWithConf(CONF_RAID), {.szFunction = "system", .error = EAGAIN}),
     .arguments = {"initsys-dd"},
     .szOut = "can not fork to nurodd\n"},
    {.szName = "WithTwoEmptyLists",
     .disks = {{"sda",
                LISTED + WIPED + STEPS{MADE_8[0], MADE_8[1], {MADE_8[2].szText, {.status = 1}}}}},
     .beside = {{"/bin/nurodd"}},
     .errors = STEPS{{"<11>partition_edit.cpp:# Failed to [/sbin/sfdisk -N2 -uS -q -f -j0 "
                      "-z4194304 -tfd -F /dev/sda], err=256"}} +
               Uncreated("sda", "2000") + NO_DISK,
     .arguments = {"initsys-dd"},
     .status = 1,
     .szShell = "/bin/nurodd   > /dev/null 2>&1\n"},
};

INSTANTIATE_TEST_SUITE_P(Duplicates, Initsys, testing::ValuesIn(DUPLICATION_CASES), ROW_NAME());

void ExpectDuplicationFails(const MACHINE &machine, const STEPS &duplicated)
{
    ExpectDisks({.szName = "one disk",
                 .disks = {{"sda", BLANK_8}},
                 .beside = duplicated + ARRAYS_A,
                 .errors = INITED_A,
                 .machine = machine,
                 .arguments = {"initsys-dd"},
                 .szOut = "system init with nurodd failed\n"});
}

TEST(InitsysDuplicate, ThatFailsChangesNothing)
{
    for (const int status : {1, 127, 255}) {
        ExpectDuplicationFails(MachineWithConf(CONF_RAID), {{DUPLICATED_A, {.status = status}}});
    }
}

TEST(InitsysDuplicate, ThatIsMissingIsAFailedOne)
{
    for (const TOOL_KIND kind : {TOOL_KIND::MISSING, TOOL_KIND::NOT_EXECUTABLE}) {
        ExpectDuplicationFails(WithTool(MachineWithConf(CONF_RAID), "/bin/nurodd", kind), {});
    }
}

} // namespace
