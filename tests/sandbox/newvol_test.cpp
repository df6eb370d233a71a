// SPDX-License-Identifier: MIT
#include "steps.h"
#include "storage_machine.h"

#include <cerrno>
#include <gtest/gtest.h>
#include <string>
#include <vector>

namespace
{

constexpr char USAGE[] = "usage:\n\tarrayctl destroy <RAID ID> \n\tarrayctl status <RAID ID> \n"
                         "\tarrayctl newvol \n\tarrayctl initsys \n\tarrayctl initsys-dd \n";
constexpr char NO_DISK[] = "No disk to create RAID... \n";
constexpr char CREATING_1[] = "Creating RAID 1 volume... \n";

struct DATA_PARTITION {
    std::string szGap = "-j260352"; // the newest layout's, whatever the disk has
    std::string szType = "-tfd";
};

std::string CleanText(const std::string &szDisk)
{
    return "/sbin/sfdisk --fast-delete 3:128 /dev/" + szDisk + "\n/sbin/sfdisk -M1 /dev/" + szDisk +
           "\n";
}

std::string RenewText(const std::string &szDisk, const DATA_PARTITION &made = {})
{
    return CleanText(szDisk) + "/sbin/sfdisk -N3 \"\" -uS -q -f " + made.szGap + " -z-1 " +
           made.szType + " -F /dev/" + szDisk + "\n";
}

void CleanExpect(MACHINE &machine, const std::string &szDisk)
{
    MachineTool(machine, "/sbin/sfdisk --fast-delete 3:128 /dev/" + szDisk);
    MachineTool(machine, "/sbin/sfdisk -M1 /dev/" + szDisk);
}

void CreateExpect(MACHINE &machine, const std::string &szDisk, const DATA_PARTITION &made = {},
                  const TOOL_ANSWER &answer = {})
{
    MachineTool(machine,
                {"/sbin/sfdisk", "-N3", "", "-uS", "-q", "-f", made.szGap, "-z-1", made.szType,
                 "-F", "/dev/" + szDisk},
                answer);
}

void DataDiskAdd(MACHINE &machine, const std::string &szDisk, const DATA_PARTITION &made = {})
{
    MachineDiskAdd(machine, szDisk);
    CleanExpect(machine, szDisk);
    CreateExpect(machine, szDisk, made);
}

MACHINE MachineWithDisks(const std::string &szConf, const std::vector<std::string> &disks)
{
    MACHINE machine = MachineWithConf(szConf);
    for (const std::string &szDisk : disks) {
        DataDiskAdd(machine, szDisk);
    }
    ShellWatch(machine);
    return machine;
}

std::string MembersText(const std::vector<std::string> &disks)
{
    std::string szText;
    for (const std::string &szDisk : disks) {
        szText += "/dev/" + szDisk + "3 ";
    }
    return szText;
}

std::string RenewAllText(const std::vector<std::string> &disks)
{
    std::string szText;
    for (const std::string &szDisk : disks) {
        szText += RenewText(szDisk);
    }
    return szText;
}

std::vector<std::string> FirstDisks(size_t nDisk)
{
    const std::vector<std::string> all = {"sda", "sdb", "sdc", "sdd"};
    return {all.begin(), all.begin() + static_cast<std::ptrdiff_t>(nDisk)};
}

// ---- which array -------------------------------------------------------------------------------

struct ARRAY_CASE {
    size_t nDisk;
    std::vector<std::string> markers;
    int level;
    std::string szShell; // between the level and the members
};

const ARRAY_CASE ARRAY_CASES[] = {
    {1, {}, 1, " -f -n1 "},
    {2, {}, 1, "  -n2 "},
    {3, {}, 5, "  -n3 "},
    {4, {}, 5, "  -n4 "},
    {1, {"/tmp/raid.0"}, 0, " -f -n1 "},
    {2, {"/tmp/raid.0"}, 0, "  -n2 "},
    {4, {"/tmp/raid.0"}, 0, "  -n4 "},
    {1, {"/tmp/raid.1"}, 1, " -f -n1 "},
    {4, {"/tmp/raid.1"}, 1, "  -n4 "},
    {1, {"/tmp/raid.5"}, 5, " -f -n1 "},
    {2, {"/tmp/raid.5"}, 5, "  -n2 "},
    {4, {"/tmp/raid.5"}, 5, "  -n4 "},
    {4, {"/tmp/raid.1", "/tmp/raid.5"}, 1, "  -n4 "},
    {4, {"/tmp/raid.0", "/tmp/raid.5"}, 0, "  -n4 "},
    {4, {"/tmp/raid.0", "/tmp/raid.1", "/tmp/raid.5"}, 0, "  -n4 "},
    {3, {"/tmp/raid.6", "/tmp/raid.10"}, 5, "  -n3 "},
};

TEST(Newvol, MakesTheDataArrayOfTheInternalDisks)
{
    for (const ARRAY_CASE &row : ARRAY_CASES) {
        SCOPED_TRACE(testing::Message() << row.nDisk << " disks, level " << row.level);
        const std::vector<std::string> disks = FirstDisks(row.nDisk);
        MACHINE machine = MachineWithDisks(CONF_RAID, disks);
        for (const std::string &szMarker : row.markers) {
            MachineFile(machine, szMarker, "");
        }
        MachineTool(machine, "/sbin/mdadm -C /dev/md2 ...");
        const RUN_RESULT result = RunEnds(
            machine, {"newvol"}, 0, "Creating RAID " + std::to_string(row.level) + " volume... \n");
        const std::string szForced = row.nDisk == 1 ? " -f" : "";
        std::string szMembers = MembersText(disks);
        EXPECT_EQ(ShellText(), "/sbin/mdadm -C /dev/md2 -amd -R -l" + std::to_string(row.level) +
                                   row.szShell + szMembers + "> /dev/null 2>&1\n");
        szMembers.pop_back();
        EXPECT_EQ(TranscriptText(result), RenewAllText(disks) +
                                              "/sbin/mdadm -C /dev/md2 -amd -R -l" +
                                              std::to_string(row.level) + szForced + " -n" +
                                              std::to_string(row.nDisk) + " " + szMembers + "\n");
        EXPECT_EQ(LogText(result), "");
        for (const std::string &szMarker : row.markers) {
            EXPECT_EQ(MachineFileRead(szMarker), "");
        }
    }
}

// Nobody can read it: to the one who runs the tool it is no marker.
TEST(Newvol, WantsAMarkerThatCanBeRead)
{
    MACHINE machine = MachineWithDisks(CONF_RAID, FirstDisks(1));
    MachineLink(machine, "/tmp/raid.0", "/no/such/file");
    MachineFolder(machine, "/tmp/raid.5");
    MachineTool(machine, "/sbin/mdadm -C /dev/md2 ...");
    const RUN_RESULT result = MachineRun(machine, {"newvol"});
    EXPECT_EQ(result.szOut, "Creating RAID 5 volume... \n");
}

TEST(Newvol, LeavesOtherPortsAlone)
{
    MACHINE machine = MachineWithDisks(CONF_RAID, {"sdb"});
    for (const char *const szOther : {"sde", "sdg", "sdh", "mmcblk0", "nuroboot"}) {
        MachineDiskAdd(machine, szOther);
    }
    MachineTool(machine, "/sbin/mdadm -C /dev/md2 -amd -R -l1 -f -n1 /dev/sdb3");
    RunEnds(machine, {"newvol"}, 0);
}

// A disk's own layout is no matter, nor is an array on it.
TEST(Newvol, GivesEveryDiskTheNewestGap)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    PartitionedDiskAdd(machine, "sda", PLACES_6);
    CleanExpect(machine, "sda");
    CreateExpect(machine, "sda");
    SystemArrayAdd(machine, {{"sda1"}});
    MachineTool(machine, "/sbin/mdadm -C /dev/md2 -amd -R -l1 -f -n1 /dev/sda3");
    RunEnds(machine, {"newvol"}, 0);
}

TEST(Newvol, TakesTypeAndGapOfTheModel)
{
    struct {
        std::string szConf;
        DATA_PARTITION made;
    } const cases[] = {
        {CONF_NO_RAID, {.szType = "-t83"}},
        {CONF_BUILDIN, {.szGap = "-j524288", .szType = "-t83"}},
    };
    for (const auto &row : cases) {
        MACHINE machine = MachineWithConf(row.szConf);
        DataDiskAdd(machine, "sda", row.made);
        MachineTool(machine, "/sbin/mdadm -C /dev/md2 -amd -R -l1 -f -n1 /dev/sda3");
        const RUN_RESULT result = RunEnds(machine, {"newvol"}, 0);
        EXPECT_EQ(CommandsOn(result, "sda"), RenewText("sda", row.made));
    }
}

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

TEST(Newvol, SaysThatThereIsNoDisk)
{
    for (const std::string &szConf : {CONF_RAID, CONF_DUAL_HEAD}) {
        MACHINE machine = MachineWithConf(szConf);
        MachineDiskAdd(machine, "sde"); // USB
        const RUN_RESULT result = RunEnds(machine, {"newvol"}, 1, NO_DISK);
        EXPECT_EQ(OrderText(result), "");
    }
}

struct ENUM_CASE {
    std::string szConf;
    const char *szDevices;
};

TEST(Newvol, FailsWhenTheDisksCannotBeEnumerated)
{
    const ENUM_CASE CASES[] = {{CONF_RAID, "INTERNAL_DEVICE"},
                                   {CONF_DUAL_HEAD, "EUNIT_DEVICE"}};
    for (const ENUM_CASE &row : CASES) {
        MACHINE machine = MachineWithConf(row.szConf);
        machine.faults = {{.szFunction = "glob", .nCall = 1, .error = EIO}};
        const RUN_RESULT result = RunEnds(machine, {"newvol"}, 1, "");
        EXPECT_EQ(LogText(result), "<11>disk_port.cpp:# read error :/sys/block/sd*\n"
                                   "<11>arrayctl.cpp:# Failed to enum " +
                                       std::string(row.szDevices) + "\n");
    }
}

// Whichever call it is that asks for the list's memory; the arguments are looked at before it.
TEST(Newvol, FailsWithoutMemoryForTheList)
{
    constexpr char NO_LIST[] = "<11>arrayctl.cpp:# Out of memeory, failed to allocate memory for "
                               "PNLIBSZLIST via NLIBCSzListAlloc\n";
    bool fSeen = false;
    for (const char *const szFunction : {"malloc", "calloc"}) {
        MACHINE machine = MachineWithConf(CONF_RAID);
        machine.faults = {{.szFunction = szFunction, .nCall = 1, .error = ENOMEM}};
        const RUN_RESULT result = MachineRun(machine, {"newvol"});
        if (LogText(result) != NO_LIST) {
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

struct FAILURE_CASE {
    const char *szName;
    MACHINE machine;
    STEPS steps;
    std::string szOut = "";
    int status = 1;
};

STEPS Cleaned(const std::string &szDisk)
{
    return {{"/sbin/sfdisk --fast-delete 3:128 /dev/" + szDisk},
            {"/sbin/sfdisk -M1 /dev/" + szDisk}};
}

STEP Created(const std::string &szDisk, const TOOL_ANSWER &answer = {})
{
    return {"/sbin/sfdisk -N3 \"\" -uS -q -f -j260352 -z-1 -tfd -F /dev/" + szDisk, answer};
}

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

// Blank disks of a model with, and of one without the key of the second head.
MACHINE BlankDisks(const std::vector<std::string> &disks, const char *szMore = "")
{
    MACHINE machine = MachineWithConf(CONF_RAID + szMore);
    for (const std::string &szDisk : disks) {
        MachineDiskAdd(machine, szDisk);
    }
    return machine;
}

constexpr char ONE_HEAD[] = "support_dual_head=no\ncacheportcfg=0x0\n";
constexpr char ARRAY_OF_ONE[] = "/sbin/mdadm -C /dev/md2 -amd -R -l1 -f -n1 /dev/sda3";

STEP ArrayFailed(const std::string &szCode)
{
    return {"<11>arrayctl.cpp:# Failed to create RAID '/dev/md2' on '/dev/sda3 ', errno=" + szCode};
}

TEST(NewvolFails, AtTheFirstDiskOrWithTheArray)
{
    const STEPS made = Cleaned("sda") + STEPS{Created("sda")};
    MACHINE killed = BlankDisks({"sda"});
    ShellKill(killed);
    const FAILURE_CASE cases[] = {
        {"the second disk", BlankDisks({"sda", "sdb", "sdc"}, ONE_HEAD),
         made + Cleaned("sdb") +
             STEPS{Created("sdb", {.szErr = "does not fit\n", .status = 1}),
                   CreateFailed("sdb"),
                   {"<11>arrayctl.cpp:# Failed to create data partition of /dev/sdb, errno=0x0"}}},
        // The lookup of the second head found no such key.
        {"the code that stands", BlankDisks({"sda"}),
         Cleaned("sda") + STEPS{Created("sda", {.status = 1}),
                                CreateFailed("sda"),
                                {"<11>arrayctl.cpp:# Failed to create data partition of /dev/sda, "
                                 "errno=0x2000"}}},
        {"no array tool", WithTool(BlankDisks({"sda"}), "/sbin/mdadm", TOOL_KIND::MISSING),
         made + STEPS{ArrayFailed("127")}, CREATING_1},
        {"no shell", WithFault(BlankDisks({"sda"}), {.szFunction = "system", .error = EAGAIN}),
         made + STEPS{{"fault system 1"}, ArrayFailed("255")}, CREATING_1},
        {"status 1", BlankDisks({"sda"}),
         made + STEPS{{ARRAY_OF_ONE, {.szOut = "noise\n", .szErr = "noise\n", .status = 1}},
                      ArrayFailed("1")},
         CREATING_1},
        {"status 2", BlankDisks({"sda"}),
         made + STEPS{{ARRAY_OF_ONE, {.status = 2}}, ArrayFailed("2")}, CREATING_1},
        {"status 127", BlankDisks({"sda"}),
         made + STEPS{{ARRAY_OF_ONE, {.status = 127}}, ArrayFailed("127")}, CREATING_1},
        {"status 255", BlankDisks({"sda"}),
         made + STEPS{{ARRAY_OF_ONE, {.status = 255}}, ArrayFailed("255")}, CREATING_1},
        // Its exit status is that of the bits 8 to 15, and a signal stands below them.
        {"not when the shell is killed", killed, made, CREATING_1, 0},
        {"not when partitions cannot be deleted", BlankDisks({"sda", "sdb"}),
         CleaningFailed("sda") + STEPS{Created("sda")} + CleaningFailed("sdb") +
             STEPS{Created("sdb"), {"/sbin/mdadm -C /dev/md2 -amd -R -l1 -n2 /dev/sda3 /dev/sdb3"}},
         CREATING_1, 0},
    };
    for (const FAILURE_CASE &row : cases) {
        (void)ExpectRun({.szName = row.szName,
                         .machine = row.machine,
                         .arguments = {"newvol"},
                         .szOut = row.szOut,
                         .status = row.status,
                         .steps = row.steps});
    }
}

TEST(NewvolFails, WithoutARowForTheModel)
{
    MACHINE machine = MachineWithConf("supportraid=yes\nsupport_buildin_storage=yes\n"
                                      "support_dual_head=no\nusbportcfg=0x30\n"
                                      "internalportcfg=0xf\n");
    MachineDiskAdd(machine, "sda");
    CleanExpect(machine, "sda");
    const RUN_RESULT result = RunEnds(machine, {"newvol"}, 1);
    EXPECT_EQ(LogErrors(result).substr(0, LogErrors(result).find('\n') + 1),
              "<11>partition_edit.cpp:# Failed to get partition layout: version=0\n");
}

// ---- dual-head machines ------------------------------------------------------------------------

constexpr char LETTERS[] = "abcdefghijklmnopqrstuvwxyz";

// Disks behind the port of sdg, in their order.
std::vector<std::string> UnitDisks(size_t nDisk)
{
    std::vector<std::string> disks;
    for (size_t i = 0; i < nDisk; i++) {
        disks.push_back(std::string("sdg") + LETTERS[i]);
    }
    return disks;
}

MACHINE MachineWithUnit(const std::string &szConf, size_t nDisk, size_t nTaken)
{
    MACHINE machine = MachineWithConf(CONF_DUAL_HEAD + szConf);
    MachineDiskAdd(machine, "sda"); // internal: left alone
    std::string szDevices;
    for (const std::string &szDisk : UnitDisks(nDisk)) {
        MachineDiskAdd(machine, szDisk);
        szDevices += (szDevices.empty() ? "/dev/" : ",/dev/") + szDisk;
    }
    ExpansionUnitAdd(machine, "host6", szDevices);
    for (const std::string &szDisk : UnitDisks(nTaken)) {
        CleanExpect(machine, szDisk);
        CreateExpect(machine, szDisk);
    }
    return machine;
}

void UnitArrayExpect(MACHINE &machine, size_t nTaken)
{
    std::string szCommand = std::string("/sbin/mdadm -C /dev/md2 -amd -R -l") +
                            (nTaken > 2 ? "5 " : "1 ") + (nTaken == 1 ? "-f " : "") + "-n" +
                            std::to_string(nTaken);
    for (const std::string &szDisk : UnitDisks(nTaken)) {
        szCommand += " /dev/" + szDisk + "3";
    }
    MachineTool(machine, szCommand);
}

std::string OverLimit(size_t nTaken)
{
    return "<11>arrayctl.cpp:# Get " + std::to_string(nTaken) +
           " disks, more than raid group split unit\n";
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
        SCOPED_TRACE(testing::Message() << row.szConf << row.nDisk);
        MACHINE machine = MachineWithUnit(row.szConf, row.nDisk, row.nTaken);
        UnitArrayExpect(machine, row.nTaken);
        const RUN_RESULT result = RunEnds(machine, {"newvol"}, 0,
                                          row.nTaken > 2 ? "Creating RAID 5 volume... \n"
                                                         : "Creating RAID 1 volume... \n");
        EXPECT_EQ(LogText(result), row.nDisk > row.nTaken ? OverLimit(row.nTaken) : "");
    }
}

TEST(NewvolDualHead, SaysThatThereIsNoDiskWithinItsLimit)
{
    for (const char *const szLimit : {"0", "-1", "none", "   "}) {
        SCOPED_TRACE(szLimit);
        const MACHINE machine =
            MachineWithUnit("raidgroup_split_units=" + std::string(szLimit) + "\n", 3, 0);
        const RUN_RESULT result = RunEnds(machine, {"newvol"}, 1, NO_DISK);
        EXPECT_EQ(LogText(result), OverLimit(0));
        EXPECT_EQ(TranscriptText(result), "");
    }
}

// The limit is looked up before each disk.
TEST(NewvolDualHead, ReadsItsLimitOnEveryTurn)
{
    MACHINE machine = MachineWithUnit("raidgroup_split_units=2\n", 4, 2);
    machine.rows[0].answer.writes = {
        {"/etc.defaults/nuroinfo.conf", CONF_DUAL_HEAD + "raidgroup_split_units=1\n"}};
    machine.rows.erase(machine.rows.begin() + 3, machine.rows.end());
    UnitArrayExpect(machine, 1);
    const RUN_RESULT result = RunEnds(machine, {"newvol"}, 0);
    EXPECT_EQ(LogText(result), OverLimit(1));
}

TEST(NewvolDualHead, AloneHasALimit)
{
    for (const char *const szLimit : {"1", "0", "-1"}) {
        MACHINE machine = MachineWithDisks(
            CONF_RAID + "raidgroup_split_units=" + szLimit + "\n", FirstDisks(4));
        MachineTool(machine, "/sbin/mdadm -C /dev/md2 -amd -R -l5 -n4 /dev/sda3 /dev/sdb3 "
                             "/dev/sdc3 /dev/sdd3");
        const RUN_RESULT result = RunEnds(machine, {"newvol"}, 0);
        EXPECT_EQ(LogText(result), "");
    }
}

TEST(NewvolDualHead, IsToldByTheMarkersFirst)
{
    MACHINE machine = MachineWithUnit("", 2, 2);
    MachineConf(machine, CONF_RAID);
    MachineFile(machine, "/tmp/.dualhead", "");
    UnitArrayExpect(machine, 2);
    RunEnds(machine, {"newvol"}, 0);

    MACHINE machineNot = MachineWithUnit("", 2, 0);
    MachineFile(machineNot, "/tmp/.not.dualhead", "");
    CleanExpect(machineNot, "sda");
    CreateExpect(machineNot, "sda");
    MachineTool(machineNot, "/sbin/mdadm -C /dev/md2 -amd -R -l1 -f -n1 /dev/sda3");
    RunEnds(machineNot, {"newvol"}, 0);
}

// ---- in turn -----------------------------------------------------------------------------------

// One disk after the other, in this process: nothing runs side by side.
TEST(Newvol, HandlesOneDiskAfterTheOther)
{
    MACHINE machine = MachineWithDisks(CONF_RAID, FirstDisks(3));
    for (TOOL_ROW &row : machine.rows) {
        row.answer.msDelay = row.argv[1] == "-N3" ? 300 : 0;
    }
    MachineTool(machine, "/sbin/mdadm -C /dev/md2 ...");
    const RUN_RESULT result = RunEnds(machine, {"newvol"}, 0);
    EXPECT_EQ(CommandsBeside(result, {}).substr(0, RenewAllText(FirstDisks(3)).size()),
              RenewAllText(FirstDisks(3)));
}

} // namespace
