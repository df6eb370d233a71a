// SPDX-License-Identifier: MIT
#include "storage_machine.h"

#include <cerrno>
#include <cstddef>
#include <gtest/gtest.h>
#include <ostream>
#include <string>
#include <vector>

namespace
{

constexpr char USAGE[] = "usage:\n\tarrayctl destroy <RAID ID> \n\tarrayctl status <RAID ID> \n"
                         "\tarrayctl newvol \n\tarrayctl initsys \n\tarrayctl initsys-dd \n";
constexpr char NO_DISK[] = "No disk to create RAID... \n";
constexpr char CREATING_1[] = "Creating RAID 1 volume... \n";
constexpr char CREATING_5[] = "Creating RAID 5 volume... \n";

// The newest layout's gap, whatever the disk has.
constexpr char DATA_8[] = "-j260352 -z-1 -tfd";

STEPS Renewed(const std::string &szDisk, const std::string &szMade = DATA_8,
              const TOOL_ANSWER &answer = {})
{
    return StepsOn(szDisk,
                   Cleaned(RANGE_DATA) +
                       STEPS{{"/sbin/sfdisk -N3 \"\" -uS -q -f " + szMade + " -F /dev/@", answer}});
}

STEPS RenewedAll(const std::vector<std::string> &disks)
{
    STEPS steps;
    for (const std::string &szDisk : disks) {
        steps = steps + Renewed(szDisk);
    }
    return steps;
}

MACHINE BlankDisks(const std::vector<std::string> &disks, const std::string &szConf = CONF_RAID)
{
    MACHINE machine = MachineWithConf(szConf);
    for (const std::string &szDisk : disks) {
        MachineDiskAdd(machine, szDisk);
    }
    return machine;
}

constexpr char ARRAY_OF_ONE[] = "/sbin/mdadm -C /dev/md2 -amd -R -l1 -f -n1 /dev/sda3";

// ---- which array -------------------------------------------------------------------------------

const std::vector<std::string> ABCD = {"sda", "sdb", "sdc", "sdd"};

struct ARRAY_CASE {
    size_t nDisk;
    std::vector<std::string> markers;
    const char *szLevel;
    const char *szShell; // between the level and the members
    const char *szArray; // the same as words, with the members
};

const ARRAY_CASE ARRAY_CASES[] = {
    {1, {}, "1", " -f -n1 ", "-f -n1 /dev/sda3"},
    {2, {}, "1", "  -n2 ", "-n2 /dev/sda3 /dev/sdb3"},
    {3, {}, "5", "  -n3 ", "-n3 /dev/sda3 /dev/sdb3 /dev/sdc3"},
    {4, {}, "5", "  -n4 ", "-n4 /dev/sda3 /dev/sdb3 /dev/sdc3 /dev/sdd3"},
    {1, {"/tmp/raid.0"}, "0", " -f -n1 ", "-f -n1 /dev/sda3"},
    {2, {"/tmp/raid.0"}, "0", "  -n2 ", "-n2 /dev/sda3 /dev/sdb3"},
    {4, {"/tmp/raid.0"}, "0", "  -n4 ", "-n4 /dev/sda3 /dev/sdb3 /dev/sdc3 /dev/sdd3"},
    {1, {"/tmp/raid.1"}, "1", " -f -n1 ", "-f -n1 /dev/sda3"},
    {4, {"/tmp/raid.1"}, "1", "  -n4 ", "-n4 /dev/sda3 /dev/sdb3 /dev/sdc3 /dev/sdd3"},
    {1, {"/tmp/raid.5"}, "5", " -f -n1 ", "-f -n1 /dev/sda3"},
    {2, {"/tmp/raid.5"}, "5", "  -n2 ", "-n2 /dev/sda3 /dev/sdb3"},
    {4, {"/tmp/raid.5"}, "5", "  -n4 ", "-n4 /dev/sda3 /dev/sdb3 /dev/sdc3 /dev/sdd3"},
    {4,
     {"/tmp/raid.1", "/tmp/raid.5"},
     "1",
     "  -n4 ",
     "-n4 /dev/sda3 /dev/sdb3 /dev/sdc3 /dev/sdd3"},
    {4,
     {"/tmp/raid.0", "/tmp/raid.5"},
     "0",
     "  -n4 ",
     "-n4 /dev/sda3 /dev/sdb3 /dev/sdc3 /dev/sdd3"},
    {4,
     {"/tmp/raid.0", "/tmp/raid.1", "/tmp/raid.5"},
     "0",
     "  -n4 ",
     "-n4 /dev/sda3 /dev/sdb3 /dev/sdc3 /dev/sdd3"},
    {3, {"/tmp/raid.6", "/tmp/raid.10"}, "5", "  -n3 ", "-n3 /dev/sda3 /dev/sdb3 /dev/sdc3"},
};

TEST(Newvol, MakesTheDataArrayOfTheInternalDisks)
{
    constexpr char MEMBERS[] = "/dev/sda3 /dev/sdb3 /dev/sdc3 /dev/sdd3 ";
    constexpr size_t MEMBER_LENGTH = 10;
    for (const ARRAY_CASE &row : ARRAY_CASES) {
        SCOPED_TRACE(testing::Message() << row.nDisk << " disks, level " << row.szLevel);
        const std::vector<std::string> disks(ABCD.begin(),
                                             ABCD.begin() + static_cast<std::ptrdiff_t>(row.nDisk));
        MACHINE machine = BlankDisks(disks);
        for (const std::string &szMarker : row.markers) {
            MachineFile(machine, szMarker, "");
        }
        ShellWatch(machine);
        const std::string szArray = std::string("/sbin/mdadm -C /dev/md2 -amd -R -l") + row.szLevel;
        ExpectRun({.szName = row.szArray,
                   .machine = machine,
                   .arguments = {"newvol"},
                   .szOut = std::string("Creating RAID ") + row.szLevel + " volume... \n",
                   .steps = RenewedAll(disks) + STEPS{{szArray + " " + row.szArray}}});
        EXPECT_EQ(ShellText(), szArray + row.szShell +
                                   std::string(MEMBERS, row.nDisk * MEMBER_LENGTH) +
                                   "> /dev/null 2>&1\n");
        for (const std::string &szMarker : row.markers) {
            EXPECT_EQ(MachineFileRead(szMarker), "");
        }
    }
}

struct RUN_AND_STEPS {
    const char *szName;
    MACHINE machine;
    STEPS steps;
    std::string szOut = CREATING_1;
    int status = 0;
    std::vector<std::string> arguments = {"newvol"};
};

void PrintTo(const RUN_AND_STEPS &row, std::ostream *pStream)
{
    *pStream << row.szName;
}

struct NewvolRuns : testing::TestWithParam<RUN_AND_STEPS> {
};

TEST_P(NewvolRuns, Once)
{
    const RUN_AND_STEPS &row = GetParam();
    ExpectRun({row.szName, row.machine, row.arguments, row.szOut, row.status, row.steps});
}

// USB, eSATA, none, card, boot
const std::vector<std::string> OTHER_PORTS = {"sdb", "sde", "sdg", "sdh", "mmcblk0", "nuroboot"};

const RUN_AND_STEPS MODEL_CASES[] = {
    // Nobody can read the first: to the one who runs the tool it is no marker.
    {"WantsAMarkerThatCanBeRead",
     With(BlankDisks({"sda"}),
          [](MACHINE &machine) {
              MachineLink(machine, "/tmp/raid.0", "/no/such/file");
              MachineFolder(machine, "/tmp/raid.5");
          }),
     Renewed("sda") + STEPS{{"/sbin/mdadm -C /dev/md2 -amd -R -l5 -f -n1 /dev/sda3"}}, CREATING_5},
    {"LeavesOtherPortsAlone", BlankDisks(OTHER_PORTS),
     Renewed("sdb") + STEPS{{"/sbin/mdadm -C /dev/md2 -amd -R -l1 -f -n1 /dev/sdb3"}}},
    // A disk's own layout is no matter, nor is an array on it.
    {"GivesEveryDiskTheNewestGap",
     With(MachineOfDisks({{"sda", PLACES_6}}),
          [](MACHINE &machine) { SystemArrayAdd(machine, {{"sda1"}}); }),
     Renewed("sda") + STEPS{{ARRAY_OF_ONE}}},
    {"TakesTheTypeOfTheModel", BlankDisks({"sda"}, CONF_NO_RAID),
     Renewed("sda", "-j260352 -z-1 -t83") + STEPS{{ARRAY_OF_ONE}}},
    {"TakesTheGapOfTheModel", BlankDisks({"sda"}, CONF_BUILDIN),
     Renewed("sda", "-j524288 -z-1 -t83") + STEPS{{ARRAY_OF_ONE}}},
    {"SaysThatThereIsNoDisk", BlankDisks({"sde"}), {}, NO_DISK, 1}, // USB
    {"SaysThatThereIsNoDiskOfAUnit", BlankDisks({"sde"}, CONF_DUAL_HEAD), {}, NO_DISK, 1},
    {"FailsWithoutTheInternalDisks",
     WithFault(MachineWithConf(CONF_RAID), {.szFunction = "glob", .error = EIO}),
     {{"fault glob 1"},
      {"<11>disk_port.cpp:# read error :/sys/block/sd*"},
      {"<11>arrayctl.cpp:# Failed to enum INTERNAL_DEVICE"}},
     "",
     1},
    {"FailsWithoutTheUnitsDisks",
     WithFault(MachineWithConf(CONF_DUAL_HEAD), {.szFunction = "glob", .error = EIO}),
     {{"fault glob 1"},
      {"<11>disk_port.cpp:# read error :/sys/block/sd*"},
      {"<11>arrayctl.cpp:# Failed to enum EUNIT_DEVICE"}},
     "",
     1},
};

INSTANTIATE_TEST_SUITE_P(, NewvolRuns, testing::ValuesIn(MODEL_CASES), ROW_NAME());

// ---- refusals ----------------------------------------------------------------------------------

TEST(Newvol, AnswersFurtherArgumentsWithTheUsage)
{
    MACHINE machine = MachineWithConf(CONF_DUAL_HEAD);
    MachineDiskAdd(machine, "sda");
    const std::vector<std::vector<std::string>> cases = {
        {"newvol", "3"}, {"newvol", ""}, {"newvol", "2", "3"}};
    for (const std::vector<std::string> &arguments : cases) {
        const RUN_RESULT result = RunEnds(machine, arguments, 1, USAGE);
        EXPECT_EQ(OrderText(result), "");
        EXPECT_EQ(MachineFileRead("/tmp/.dualhead"), std::nullopt); // nothing was asked
    }
}

// Whichever call it is that asks for the list's memory; the arguments are looked at before it.
TEST(Newvol, FailsWithoutMemoryForTheList)
{
    bool fSeen = false;
    for (const char *const szFunction : {"malloc", "calloc"}) {
        MACHINE machine = MachineWithConf(CONF_RAID);
        machine.faults = {{.szFunction = szFunction, .nCall = 1, .error = ENOMEM}};
        const RUN_RESULT result = MachineRun(machine, {"newvol"});
        if (LogText(result) != NO_MEMORY_FOR_LIST) {
            continue;
        }
        fSeen = true;
        EXPECT_EQ(result.status, 1);
        EXPECT_EQ(result.szOut, "");
        EXPECT_EQ(MachineRun(machine, {"newvol", "3"}).szOut, USAGE);
    }
    EXPECT_TRUE(fSeen);
}

// ---- commands that fail ------------------------------------------------------------------------

STEPS CleaningFailed(const std::string &szDisk)
{
    return {{"/sbin/sfdisk --fast-delete 3:128 /dev/" + szDisk, {.status = 1}},
            {"<15>partition_edit.cpp:# Failed to do '/sbin/sfdisk --fast-delete 3:128 /dev/" +
             szDisk + "'"},
            {"/sbin/sfdisk -M1 /dev/" + szDisk, {.status = 1}},
            {"<11>partition_edit.cpp:# Failed to add ms-dos signature to /dev/" + szDisk +
             ", err=256"}};
}

STEP CreateFailed(const std::string &szDisk)
{
    return {"<11>partition_edit.cpp:# Failed to [/sbin/sfdisk -N3  -uS -q -f -j260352 -z-1 -tfd "
            "-F /dev/" +
            szDisk + "], err=256"};
}

// All keys that are asked are there, so no lookup has left a code before.
const std::string CONF_ONE_HEAD = CONF_RAID + "support_dual_head=no\ncacheportcfg=0x0\n";

STEP ArrayFailed(const std::string &szCode)
{
    return {"<11>arrayctl.cpp:# Failed to create RAID '/dev/md2' on '/dev/sda3 ', errno=" + szCode};
}

const STEPS MADE = Renewed("sda");
const TOOL_ANSWER FAILED = {.status = 1};

RUN_AND_STEPS ArrayFails(const char *szName, const TOOL_ANSWER &answer, const std::string &szCode)
{
    return {szName, BlankDisks({"sda"}), MADE + STEPS{{ARRAY_OF_ONE, answer}, ArrayFailed(szCode)},
            CREATING_1, 1};
}

const RUN_AND_STEPS FAILURE_CASES[] = {
    {"AtTheSecondDisk", BlankDisks({"sda", "sdb", "sdc"}, CONF_ONE_HEAD),
     MADE + Renewed("sdb", DATA_8, {.szErr = "does not fit\n", .status = 1}) +
         STEPS{CreateFailed("sdb"),
               {"<11>arrayctl.cpp:# Failed to create data partition of /dev/sdb, errno=0x0"}},
     "", 1},
    // The lookup of the second head found no such key.
    {"WithTheCodeThatStands", BlankDisks({"sda"}),
     Renewed("sda", DATA_8, FAILED) +
         STEPS{CreateFailed("sda"),
               {"<11>arrayctl.cpp:# Failed to create data partition of /dev/sda, errno=0x2000"}},
     "", 1},
    {"WithoutAnArrayTool", WithTool(BlankDisks({"sda"}), "/sbin/mdadm", TOOL_KIND::MISSING),
     MADE + STEPS{ArrayFailed("127")}, CREATING_1, 1},
    {"WithoutAShell", WithFault(BlankDisks({"sda"}), {.szFunction = "system", .error = EAGAIN}),
     MADE + STEPS{{"fault system 1"}, ArrayFailed("255")}, CREATING_1, 1},
    ArrayFails("WithTheArraysStatus", {.szOut = "noise\n", .szErr = "noise\n", .status = 1}, "1"),
    ArrayFails("WithTheArraysStatus2", {.status = 2}, "2"),
    ArrayFails("WithTheArraysStatus127", {.status = 127}, "127"),
    ArrayFails("WithTheArraysStatus255", {.status = 255}, "255"),
    // Its exit status is that of the bits 8 to 15, and a signal stands below them.
    {"NotWhenTheShellIsKilled", With(BlankDisks({"sda"}), ShellKill), MADE},
    {"NotWhenPartitionsCannotBeDeleted", BlankDisks({"sda", "sdb"}),
     CleaningFailed("sda") + STEPS{MADE[2]} + CleaningFailed("sdb") +
         STEPS{Renewed("sdb")[2], {"/sbin/mdadm -C /dev/md2 -amd -R -l1 -n2 /dev/sda3 /dev/sdb3"}}},
};

INSTANTIATE_TEST_SUITE_P(Fails, NewvolRuns, testing::ValuesIn(FAILURE_CASES), ROW_NAME());

TEST(NewvolFails, WithoutARowForTheModel)
{
    MACHINE machine = MachineWithConf("supportraid=yes\nsupport_buildin_storage=yes\n"
                                      "support_dual_head=no\nusbportcfg=0x30\n"
                                      "internalportcfg=0xf\n");
    MachineDiskAdd(machine, "sda");
    StepsExpect(machine, StepsOn("sda", Cleaned(RANGE_DATA)));
    const RUN_RESULT result = RunEnds(machine, {"newvol"}, 1);
    EXPECT_EQ(LogErrors(result).substr(0, LogErrors(result).find('\n') + 1),
              "<11>partition_edit.cpp:# Failed to get partition layout: version=0\n");
}

// ---- dual-head machines ------------------------------------------------------------------------

// The first disks behind the port of sdg, in their order.
std::vector<std::string> UnitDisks(size_t nDisk)
{
    std::vector<std::string> disks;
    for (size_t i = 0; i < nDisk; i++) {
        disks.push_back(std::string("sdg") + static_cast<char>('a' + i));
    }
    return disks;
}

MACHINE MachineWithUnit(const std::string &szConf, size_t nDisk)
{
    MACHINE machine = BlankDisks(UnitDisks(nDisk), CONF_DUAL_HEAD + szConf);
    MachineDiskAdd(machine, "sda"); // internal: left alone
    std::string szDevices;
    for (const std::string &szDisk : UnitDisks(nDisk)) {
        szDevices += (szDevices.empty() ? "/dev/" : ",/dev/") + szDisk;
    }
    ExpansionUnitAdd(machine, "host6", szDevices);
    return machine;
}

STEPS OverLimit(size_t nTaken)
{
    return {{"<11>arrayctl.cpp:# Get " + std::to_string(nTaken) +
             " disks, more than raid group split unit"}};
}

STEPS UnitArray(size_t nTaken)
{
    std::string szCommand = std::string("/sbin/mdadm -C /dev/md2 -amd -R -l") +
                            (nTaken > 2 ? "5 " : "1 ") + (nTaken == 1 ? "-f " : "") + "-n" +
                            std::to_string(nTaken);
    for (const std::string &szDisk : UnitDisks(nTaken)) {
        szCommand += " /dev/" + szDisk + "3";
    }
    return {{szCommand}};
}

struct LIMIT_CASE {
    std::string szConf;
    size_t nDisk;
    size_t nTaken;
};

const LIMIT_CASE LIMIT_CASES[] = {
    {"", 12, 12},
    {"", 13, 12},
    {"", 15, 12},
    {"raidgroup_split_units=2\n", 2, 2},
    {"raidgroup_split_units=\"2\"\n", 3, 2},
    {"raidgroup_split_units=1\n", 4, 1},
    {"raidgroup_split_units=3 disks\n", 4, 3},
    {"raidgroup_split_units=15\n", 15, 15},
    {"raidgroup_split_units=\n", 13, 12},                 // no value
    {"raidgroup_split_units=0000000000000002\n", 13, 12}, // 16 characters do not fit
    {"raidgroup_split_units=000000000000002\n", 13, 2},
};

TEST(NewvolDualHead, TakesTheDisksOfAnExpansionUnitUpToItsLimit)
{
    for (const LIMIT_CASE &row : LIMIT_CASES) {
        SCOPED_TRACE(row.nDisk);
        ExpectRun({.szName = row.szConf.c_str(),
                   .machine = MachineWithUnit(row.szConf, row.nDisk),
                   .arguments = {"newvol"},
                   .szOut = row.nTaken > 2 ? CREATING_5 : CREATING_1,
                   .steps = RenewedAll(UnitDisks(row.nTaken)) +
                            (row.nDisk > row.nTaken ? OverLimit(row.nTaken) : STEPS{}) +
                            UnitArray(row.nTaken)});
    }
}

TEST(NewvolDualHead, SaysThatThereIsNoDiskWithinItsLimit)
{
    for (const char *const szLimit : {"0", "-1", "none", "   "}) {
        ExpectRun(
            {.szName = szLimit,
             .machine = MachineWithUnit("raidgroup_split_units=" + std::string(szLimit) + "\n", 3),
             .arguments = {"newvol"},
             .szOut = NO_DISK,
             .status = 1,
             .steps = OverLimit(0)});
    }
}

STEPS RenewedWithLimit1()
{
    STEPS steps = Renewed("sdga");
    steps[0].answer.writes = {
        {"/etc.defaults/nuroinfo.conf", CONF_DUAL_HEAD + "raidgroup_split_units=1\n"}};
    return steps;
}

const RUN_AND_STEPS HEAD_CASES[] = {
    // It is looked up before each disk.
    {"ReadsItsLimitOnEveryTurn", MachineWithUnit("raidgroup_split_units=2\n", 4),
     RenewedWithLimit1() + OverLimit(1) + UnitArray(1)},
    {"IsToldByTheMarkerFirst",
     With(MachineWithUnit("", 2),
          [](MACHINE &machine) {
              MachineConf(machine, CONF_RAID);
              MachineFile(machine, "/tmp/.dualhead", "");
          }),
     RenewedAll(UnitDisks(2)) + UnitArray(2)},
    {"IsDeniedByTheMarkerFirst", WithFile(MachineWithUnit("", 2), "/tmp/.not.dualhead", ""),
     Renewed("sda") + STEPS{{ARRAY_OF_ONE}}},
};

INSTANTIATE_TEST_SUITE_P(DualHead, NewvolRuns, testing::ValuesIn(HEAD_CASES), ROW_NAME());

TEST(NewvolDualHead, AloneHasALimit)
{
    for (const char *const szLimit : {"1", "0", "-1"}) {
        ExpectRun(
            {.szName = szLimit,
             .machine = BlankDisks(ABCD, CONF_RAID + "raidgroup_split_units=" + szLimit + "\n"),
             .arguments = {"newvol"},
             .szOut = CREATING_5,
             .steps = RenewedAll(ABCD) +
                      STEPS{{"/sbin/mdadm -C /dev/md2 -amd -R -l5 -n4 /dev/sda3 /dev/sdb3 "
                             "/dev/sdc3 /dev/sdd3"}}});
    }
}

// ---- in turn -----------------------------------------------------------------------------------

// One disk after the other, in this process: nothing runs side by side.
TEST(Newvol, HandlesOneDiskAfterTheOther)
{
    const TOOL_ANSWER late = {.msDelay = 300};
    ExpectRun({.szName = "three",
               .machine = BlankDisks({"sda", "sdb", "sdc"}),
               .arguments = {"newvol"},
               .szOut = CREATING_5,
               .steps = Renewed("sda", DATA_8, late) + Renewed("sdb", DATA_8, late) +
                        Renewed("sdc", DATA_8, late) +
                        STEPS{{"/sbin/mdadm -C /dev/md2 -amd -R -l5 -n3 /dev/sda3 /dev/sdb3 "
                               "/dev/sdc3"}}});
}

} // namespace
