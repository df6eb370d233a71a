// SPDX-License-Identifier: MIT
#include "storage_machine.h"

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <gtest/gtest.h>
#include <string>
#include <vector>

namespace
{

constexpr char WORD[] = "enumformatalldisks";
constexpr char WORD_DUAL_HEAD[] = "enumformatalldisks_indualhead_install";
constexpr char NO_TYPE[] = "<11>arrayctl.cpp:# Failed to get format type\n";
constexpr char FORCE_MARKER[] = "/.force_clean_all_disk";

std::string DecideText(const std::string &szDisk)
{
    return ListingCommand(szDisk, 1) + "\n" + ListingCommand(szDisk, 2) + "\n";
}

void ExpectPrinted(const RUN_RESULT &result, const std::string &szNumbers, int status)
{
    EXPECT_EQ(result.szOut, szNumbers);
    EXPECT_EQ(result.szErr, "");
    EXPECT_EQ(result.status, status);
}

// Both words on a machine with one head.
void ExpectNumbers(const MACHINE &machine, const std::string &szNumbers, int status)
{
    for (const char *const szWord : {WORD, WORD_DUAL_HEAD}) {
        SCOPED_TRACE(szWord);
        ExpectPrinted(MachineRun(machine, {szWord}), szNumbers, status);
    }
}

// A running system array of layout 8, so that no disk is asked for the wanted layout.
MACHINE MachineOfEight(const std::string &szConf)
{
    MACHINE machine = MachineWithConf(szConf);
    PartitionedDiskAdd(machine, "sdz", PLACES_8); // on no port
    SystemArrayAdd(machine, {{"sdz1"}});
    return machine;
}

// ---- which disks -------------------------------------------------------------------------------

TEST(FormatAll, PrintsNothingWithoutADisk)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineDiskAdd(machine, "sde"); // USB
    ExpectNumbers(machine, "", 0);
    EXPECT_EQ(LogText(MachineRun(machine, {WORD})), "");
}

TEST(FormatAll, PrintsEveryBlankDisk)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    for (const char *const szDisk : {"sda", "sdb", "sdd"}) {
        BlankDiskAdd(machine, szDisk);
    }
    ExpectNumbers(machine, "1 2 4 ", 3);
    const RUN_RESULT result = MachineRun(machine, {WORD, "further", "arguments"});
    ExpectPrinted(result, "1 2 4 ", 3);
    for (const char *const szDisk : {"sda", "sdb", "sdd"}) {
        EXPECT_EQ(CommandsOn(result, szDisk), DecideText(szDisk));
    }
    EXPECT_EQ(CommandsBeside(result, {"sda", "sdb", "sdd"}), "");
    EXPECT_EQ(LogErrors(result), "");
}

TEST(FormatAll, PrintsTheBlankDiskBesideACurrentOne)
{
    MACHINE machine = MachineOfEight(CONF_RAID);
    DecidedDiskAdd(machine, "sda", PLACES_8);
    BlankDiskAdd(machine, "sdb");
    ExpectNumbers(machine, "2 ", 1);
}

TEST(FormatAll, PrintsNoUnrecognisedDiskBesideACurrentOne)
{
    MACHINE machine = MachineOfEight(CONF_RAID);
    DecidedDiskAdd(machine, "sda", PLACES_8);
    DecidedDiskAdd(machine, "sdb", PLACES_FOREIGN);
    ExpectNumbers(machine, "", 0);
}

TEST(FormatAll, PrintsNoCurrentDisk)
{
    MACHINE machine = MachineOfEight(CONF_RAID);
    DecidedDiskAdd(machine, "sda", PLACES_8);
    DecidedDiskAdd(machine, "sdb", PLACES_7); // an upgrade keeps its data
    ExpectNumbers(machine, "", 0);
}

// Unrecognised disks and those that an array holds too: the whole list.
TEST(FormatAll, PrintsEveryDiskWithoutACurrentOne)
{
    MACHINE machine = MachineOfEight(CONF_RAID);
    DecidedDiskAdd(machine, "sda", PLACES_FOREIGN);
    DecidedDiskAdd(machine, "sdb", PLACES_6);
    SuperblockExpect(machine, "sdb3", 2);
    BlankDiskAdd(machine, "sdc");
    ExpectNumbers(machine, "1 2 3 ", 3);
    EXPECT_EQ(LogErrors(MachineRun(machine, {WORD})), NO_TYPE);
}

TEST(FormatAll, PrintsNoDiskOfAnotherLayoutThatAnArrayHolds)
{
    MACHINE machine = MachineOfEight(CONF_RAID);
    DecidedDiskAdd(machine, "sda", PLACES_8);
    DecidedDiskAdd(machine, "sdb", PLACES_6);
    SuperblockExpect(machine, "sdb3", 2);
    DecidedDiskAdd(machine, "sdc", PLACES_6);
    NoSuperblockExpect(machine, "sdc3");
    NoSuperblockExpect(machine, "sdc5");
    ExpectNumbers(machine, "3 ", 1);
    EXPECT_EQ(LogErrors(MachineRun(machine, {WORD})), NO_TYPE);
}

TEST(FormatAll, PrintsEveryDiskWhereTheMarkerStands)
{
    MACHINE machine = MachineOfEight(CONF_RAID);
    MachineFile(machine, FORCE_MARKER, "");
    PartitionedDiskAdd(machine, "sda", PLACES_8);
    PartitionedDiskAdd(machine, "sdb", PLACES_6);
    PartitionedDiskAdd(machine, "sdc", PLACES_FOREIGN);
    MachineDiskAdd(machine, "sdd");
    ExpectNumbers(machine, "1 2 3 4 ", 4);
    EXPECT_EQ(TranscriptText(MachineRun(machine, {WORD})), "");
}

// None at all, and fewer, are sizes like any: the disk is not blank.
TEST(FormatAll, TakesAListedPartitionForOneWhateverItsSize)
{
    MACHINE machine = MachineOfEight(CONF_RAID);
    DecidedDiskAdd(machine, "sda", PLACES_8);
    MachineDiskAdd(machine, "sdb");
    MachineTool(machine, ListingCommand("sdb", 1), {.szOut = "/dev/sdb1 1 2 -2 83\n"});
    MachineTool(machine, ListingCommand("sdb", 2), {.szOut = "/dev/sdb2 1 2 -7 83\n"});
    MachineDiskAdd(machine, "sdc");
    MachineTool(machine, ListingCommand("sdc", 1), {.szOut = "/dev/sdc1 1 2 0 83\n"});
    MachineTool(machine, ListingCommand("sdc", 2));
    BlankDiskAdd(machine, "sdd");
    ExpectNumbers(machine, "4 ", 1);
}

// ---- the wanted layout -------------------------------------------------------------------------

// The first disk's, where the preparing command would take the biggest.
TEST(FormatAll, WantsTheLayoutOfTheFirstDisk)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    DecidedDiskAdd(machine, "sda", PLACES_6);
    SuperblockExpect(machine, "sda3", 2);
    DecidedDiskAdd(machine, "sdb", PLACES_8);
    NoSuperblockExpect(machine, "sdb3");
    NoSuperblockExpect(machine, "sdb5");
    ExpectNumbers(machine, "2 ", 1);
    EXPECT_EQ(LogErrors(MachineRun(machine, {WORD})), "");
}

TEST(FormatAll, WantsSevenWithBuiltInStorageAndKnowsNoDiskOfIt)
{
    MACHINE machine = MachineWithConf(CONF_BUILDIN);
    DecidedDiskAdd(machine, "sda", PLACES_BUILDIN);
    BlankDiskAdd(machine, "sdb");
    ExpectNumbers(machine, "1 2 ", 2);
}

TEST(FormatAll, WorksOnAMachineWithoutRaid)
{
    MACHINE machine = MachineWithConf(CONF_NO_RAID);
    DecidedDiskAdd(machine, "sda", PLACES_8);
    BlankDiskAdd(machine, "sdb");
    DecidedDiskAdd(machine, "sdc", PLACES_3_NO_RAID); // no layout of RAID machines
    ExpectNumbers(machine, "2 ", 1);
}

TEST(FormatAll, KnowsNoDiskWithoutTheModelsFile)
{
    MACHINE machine = MachineMake();
    MachineDiskAdd(machine, "sda");
    ExpectNumbers(machine, "", 0);
}

// ---- dual-head machines ------------------------------------------------------------------------

MACHINE MachineWithUnit()
{
    MACHINE machine = MachineWithConf(CONF_DUAL_HEAD);
    MachineDiskAdd(machine, "sda"); // internal: left alone
    ExpansionUnitAdd(machine, "host6", "/dev/sdga,/dev/sdgc");
    return machine;
}

TEST(FormatAllDualHead, NumbersTheDisksOfAnExpansionUnit)
{
    MACHINE machine = MachineWithUnit();
    BlankDiskAdd(machine, "sdga"); // 7 * 26 + 1
    BlankDiskAdd(machine, "sdgc");
    ExpectPrinted(MachineRun(machine, {WORD}), "183 185 ", 2);
}

// Its name is part of those that the unit tells, and so it counts as one.
TEST(FormatAllDualHead, NumbersTheUnitsOwnPort)
{
    MACHINE machine = MachineWithUnit();
    BlankDiskAdd(machine, "sdg");
    ExpectPrinted(MachineRun(machine, {WORD}), "7 ", 1);
}

TEST(FormatAllDualHead, SaysAllInADualHeadInstallation)
{
    MACHINE machine = MachineWithUnit();
    BlankDiskAdd(machine, "sdga");
    BlankDiskAdd(machine, "sdgc");
    ExpectPrinted(MachineRun(machine, {WORD_DUAL_HEAD}), "all", 2);
}

TEST(FormatAllDualHead, SaysAllForOneDiskOfTwoToo)
{
    MACHINE machine = MachineWithUnit();
    DecidedDiskAdd(machine, "sdga", PLACES_8);
    SuperblockExpect(machine, "sdga3", 2);
    BlankDiskAdd(machine, "sdgc");
    ExpectPrinted(MachineRun(machine, {WORD_DUAL_HEAD}), "all", 1);
    ExpectPrinted(MachineRun(machine, {WORD}), "185 ", 1);
}

TEST(FormatAllDualHead, SaysNothingWithoutADiskToFormat)
{
    MACHINE machine = MachineWithUnit();
    ExpectPrinted(MachineRun(machine, {WORD_DUAL_HEAD}), "", 0);
    DecidedDiskAdd(machine, "sdga", PLACES_8);
    SuperblockExpect(machine, "sdga3", 2);
    ExpectPrinted(MachineRun(machine, {WORD_DUAL_HEAD}), "", 0);
}

TEST(FormatAllDualHead, SaysAllWhereTheMarkerStands)
{
    MACHINE machine = MachineWithUnit();
    MachineFile(machine, FORCE_MARKER, "");
    MachineDiskAdd(machine, "sdga");
    ExpectPrinted(MachineRun(machine, {WORD_DUAL_HEAD}), "all", 1);
    ExpectPrinted(MachineRun(machine, {WORD}), "183 ", 1);
}

TEST(FormatAllDualHead, IsToldByTheMarkersFirst)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineFile(machine, "/tmp/.dualhead", "");
    MachineDiskAdd(machine, "sda");
    ExpansionUnitAdd(machine, "host6", "/dev/sdga");
    BlankDiskAdd(machine, "sdga");
    ExpectPrinted(MachineRun(machine, {WORD_DUAL_HEAD}), "all", 1);

    MACHINE machineNot = MachineWithConf(CONF_DUAL_HEAD);
    MachineFile(machineNot, "/tmp/.not.dualhead", "");
    BlankDiskAdd(machineNot, "sda");
    ExpectPrinted(MachineRun(machineNot, {WORD_DUAL_HEAD}), "1 ", 1);
}

// ---- the exit status ---------------------------------------------------------------------------

// Disks that all have the letter of sda, which is what makes them internal and gives their number.
MACHINE MachineWithManyDisks(int nDisk)
{
    MACHINE machine = MachineOfEight(CONF_RAID);
    MachineFile(machine, FORCE_MARKER, "");
    for (int i = 0; i < nDisk; i++) {
        MachineFile(machine, "/sys/block/sda" + std::to_string(1000 + i) + "/size", "1\n");
    }
    return machine;
}

std::string Ones(int n)
{
    std::string szText;
    for (int i = 0; i < n; i++) {
        szText += "1 ";
    }
    return szText;
}

TEST(FormatAllStatus, IsTheCountModulo256)
{
    ExpectPrinted(MachineRun(MachineWithManyDisks(255), {WORD}), Ones(255), 255);
    ExpectPrinted(MachineRun(MachineWithManyDisks(256), {WORD}), Ones(256), 0);
    ExpectPrinted(MachineRun(MachineWithManyDisks(300), {WORD}), Ones(300), 44);
}

// ---- failures ----------------------------------------------------------------------------------

TEST(FormatAllFails, WhenTheDisksCannotBeEnumerated)
{
    struct {
        std::string szConf;
        const char *szDevices;
    } const cases[] = {{CONF_RAID, "INTERNAL_DEVICE"}, {CONF_DUAL_HEAD, "EUNIT_DEVICE"}};
    for (const auto &row : cases) {
        MACHINE machine = MachineWithConf(row.szConf);
        MachineDiskAdd(machine, "sda");
        machine.faults = {{.szFunction = "glob", .nCall = 1, .error = EIO}};
        const RUN_RESULT result = MachineRun(machine, {WORD});
        ExpectPrinted(result, "", 1);
        EXPECT_EQ(LogText(result), "<11>disk_port.cpp:# read error :/sys/block/sd*\n"
                                   "<11>arrayctl.cpp:# Failed to enum " +
                                       std::string(row.szDevices) + "\n");
    }
}

// Even without a disk: the layout is asked for before the list is looked at.
TEST(FormatAllFails, WhenNoLayoutIsFound)
{
    for (const bool fDisk : {true, false}) {
        MACHINE machine = MachineWithConf(CONF_RAID);
        if (fDisk) {
            MachineDiskAdd(machine, "sda");
        }
        machine.faults = {{.szFunction = "glob", .nCall = 2, .error = EIO}};
        const RUN_RESULT result = MachineRun(machine, {WORD_DUAL_HEAD});
        ExpectPrinted(result, "", 1);
        EXPECT_EQ(LogText(result), "<11>arrayctl.cpp:# Failed to find partition layout\n");
    }
}

constexpr char NO_FORK[] = "<11>process.cpp:# fork error, errno=Resource temporarily unavailable\n"
                           "<11>arrayctl.cpp:# Failed to fork.\n";

TEST(FormatAllFails, AtOnceWhenAChildCannotBeForked)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    for (const char *const szDisk : {"sda", "sdb"}) {
        MachineDiskAdd(machine, szDisk);
        MachineTool(machine, ListingCommand(szDisk, 1), {.nMeet = NEVER, .nTimes = ANY_TIMES});
        MachineTool(machine, ListingCommand(szDisk, 2), {.nMeet = NEVER, .nTimes = ANY_TIMES});
    }
    machine.fMayLeaveChildren = true; // the first is not waited for
    for (const int nCall : {1, 2}) {
        machine.faults = {{.szFunction = "fork", .nCall = nCall, .error = EAGAIN}};
        const RUN_RESULT result = MachineRun(machine, {WORD});
        ExpectPrinted(result, "", 1);
        EXPECT_EQ(LogErrors(result), NO_FORK);
    }
}

TEST(FormatAllFails, ForTheDiskThatCannotBeWaitedFor)
{
    MACHINE machine = MachineOfEight(CONF_RAID);
    DecidedDiskAdd(machine, "sda", PLACES_8);
    BlankDiskAdd(machine, "sdb");
    BlankDiskAdd(machine, "sdc");
    machine.faults = {{.szFunction = "waitpid", .nCall = 2, .error = ECHILD}};
    machine.fMayLeaveChildren = true;
    const RUN_RESULT result = MachineRun(machine, {WORD});
    ExpectPrinted(result, "3 ", 1);
    EXPECT_EQ(LogOf(result, "arrayctl.cpp"),
              "<11>arrayctl.cpp:# Wait pid failed. pid: # disk: sdb\n");
}

// The disk whose number cannot be told is told as 0: its port is looked up anew, because the mask
// of the USB ports is 0, and the model's file is away by then.
TEST(FormatAllFails, ToNumberADiskWhosePortIsUnknown)
{
    MACHINE machine = MachineWithConf("supportraid=yes\nsupport_buildin_storage=no\nusbportcfg=0\n"
                                      "internalportcfg=0xf\n");
    for (const char *const szDisk : {"sda", "sdb"}) {
        MachineDiskAdd(machine, szDisk);
        MachineTool(machine, ListingCommand(szDisk, 1));
        MachineTool(machine, ListingCommand(szDisk, 2),
                    {.removes = {"/etc.defaults/nuroinfo.conf"}});
    }
    const RUN_RESULT result = MachineRun(machine, {WORD});
    ExpectPrinted(result, "0 0 ", 2);
    std::string szExpected;
    for (const std::string szDisk : {"sda", "sdb"}) {
        szExpected += "<11>disk_port.cpp:# Get usbportcfg key from /etc.defaults/nuroinfo.conf "
                      "Error\n"
                      "<11>disk_path.cpp:# bad paramters: unknown device, disk path: /dev/" +
                      szDisk + "\n<11>arrayctl.cpp:# DiskPathParse(/dev/" + szDisk + ") fail\n";
    }
    EXPECT_EQ(LogErrors(result), szExpected);
}

// The second disk's port alone is unknown: of the last four look-ups, which are its ports', the
// first one fails. It has no number, not the first disk's.
TEST(FormatAllFails, ToNumberADiskBehindANumberedOne)
{
    MACHINE machine = MachineWithConf("supportraid=yes\nsupport_buildin_storage=no\nusbportcfg=0\n"
                                      "internalportcfg=0xf\n");
    MachineFile(machine, FORCE_MARKER, "");
    MachineDiskAdd(machine, "sda");
    MachineDiskAdd(machine, "sdb");
    machine.fCallsTold = true;
    ExpectPrinted(MachineRun(machine, {WORD}), "1 2 ", 2);
    const std::vector<std::string> calls = MachineCalls();
    const auto nOpened = std::count_if(calls.begin(), calls.end(), [](const std::string &szCall) {
        return szCall.rfind("0 fopen ", 0) == 0;
    });
    machine.faults = {{.szFunction = "fopen",
                       .nCall = static_cast<int>(nOpened) - 3,
                       .error = EMFILE,
                       .szProcess = "0"}};
    const RUN_RESULT result = MachineRun(machine, {WORD});
    ExpectPrinted(result, "1 0 ", 2);
    EXPECT_EQ(LogOf(result, "arrayctl.cpp"), "<11>arrayctl.cpp:# DiskPathParse(/dev/sdb) fail\n");
}

// Whichever calls they are that ask for memory. The C library's own are among them, and its glob()
// does not survive each of them, so only the runs that end in the message are looked at.
TEST(FormatAllFails, WithoutMemory)
{
    constexpr char NO_LIST[] = "<11>arrayctl.cpp:# Out of memeory, failed to allocate memory for "
                               "PNLIBSZLIST via NLIBCSzListAlloc\n";
    constexpr char NO_CHILDREN[] = "<11>arrayctl.cpp:# Failed to alloc\n";
    int nListSeen = 0;
    bool fChildrenSeen = false;
    for (const char *const szFunction : {"malloc", "calloc"}) {
        for (int nCall = 1; nCall <= 24; nCall++) {
            MACHINE machine = MachineOfEight(CONF_RAID);
            MachineFile(machine, FORCE_MARKER, "");
            MachineDiskAdd(machine, "sda");
            machine.faults = {{.szFunction = szFunction, .nCall = nCall, .error = ENOMEM}};
            const RUN_RESULT result = MachineTry(machine, {WORD});
            const std::string szLog = LogOf(result, "arrayctl.cpp");
            if (szLog == NO_LIST || szLog == NO_CHILDREN) {
                ExpectPrinted(result, "", 1);
                EXPECT_EQ(result.problems, std::vector<std::string>());
            }
            nListSeen += szLog == NO_LIST ? 1 : 0;
            fChildrenSeen = fChildrenSeen || szLog == NO_CHILDREN;
        }
    }
    EXPECT_GE(nListSeen, 3);
    EXPECT_TRUE(fChildrenSeen);
}

// Forty names that make a list of 1024 bytes grow; the disks decide themselves at once.
TEST(FormatAllFails, WhenTheListOfDisksToFormatCannotGrow)
{
    bool fSeen = false;
    for (int nCall = 1; nCall <= 400 && !fSeen; nCall++) {
        MACHINE machine = MachineOfEight(CONF_RAID);
        MachineFile(machine, FORCE_MARKER, "");
        for (int i = 10; i < 50; i++) {
            MachineFile(machine, "/sys/block/sda_with_a_rather_long_" + std::to_string(i) + "/size",
                        "1\n");
        }
        machine.faults = {{.szFunction = "malloc", .nCall = nCall, .error = ENOMEM}};
        machine.fMayLeaveChildren = true; // those behind the disk that did not fit
        const RUN_RESULT result = MachineTry(machine, {WORD});
        if (result.status != 255) {
            continue;
        }
        fSeen = true;
        EXPECT_EQ(result.problems, std::vector<std::string>());
        EXPECT_EQ(result.szOut, "");
        const std::string szLog = LogOf(result, "arrayctl.cpp");
        EXPECT_EQ(szLog.rfind("<11>arrayctl.cpp:# Push /dev/sda_with_a_rather_long_", 0), 0U)
            << szLog;
        EXPECT_NE(szLog.find(" into FormatAllList failed\n"), std::string::npos) << szLog;
    }
    EXPECT_TRUE(fSeen);
}

// ---- children ----------------------------------------------------------------------------------

TEST(FormatAllChildren, WorkSideBySide)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    for (const char *const szDisk : {"sda", "sdb", "sdc", "sdd"}) {
        BlankDiskAdd(machine, szDisk);
    }
    for (TOOL_ROW &row : machine.rows) {
        row.answer.nMeet = HasWord(row, "-N1") ? 4 : 0;
    }
    const RUN_RESULT result = MachineRun(machine, {WORD});
    ExpectPrinted(result, "1 2 3 4 ", 4);
}

// A killed child is no disk of either list, and the others go on.
TEST(FormatAllChildren, CostTheirOwnDiskWhenKilled)
{
    MACHINE machine = MachineOfEight(CONF_RAID);
    DecidedDiskAdd(machine, "sda", PLACES_8);
    MachineDiskAdd(machine, "sdb");
    MachineTool(machine, ListingCommand("sdb", 1), {.signalCaller = SIGKILL, .msDelay = 1000});
    MachineDiskAdd(machine, "sdc");
    MachineTool(machine, ListingCommand("sdc", 1), {.signalCaller = SIGTERM});
    BlankDiskAdd(machine, "sdd");
    machine.fMayLeaveChildren = true; // the killing partitioner itself
    const RUN_RESULT result = MachineRun(machine, {WORD});
    ExpectPrinted(result, "4 ", 1);
    EXPECT_EQ(LogOf(result, "arrayctl.cpp"),
              "<11>arrayctl.cpp:# Child exit not normally, pid: # disk: sdb\n"
              "<11>arrayctl.cpp:# Child exit not normally, pid: # disk: sdc\n");
}

// Nothing but questions goes to the disks.
TEST(FormatAllChildren, ChangeNothing)
{
    MACHINE machine = MachineOfEight(CONF_RAID);
    DecidedDiskAdd(machine, "sda", PLACES_6);
    NoSuperblockExpect(machine, "sda3");
    NoSuperblockExpect(machine, "sda5");
    const RUN_RESULT result = MachineRun(machine, {WORD});
    ExpectPrinted(result, "1 ", 1);
    EXPECT_EQ(TranscriptText(result),
              DecideText("sda") + "/sbin/mdadm -E /dev/sda3\n/sbin/mdadm -E /dev/sda5\n");
}

} // namespace
