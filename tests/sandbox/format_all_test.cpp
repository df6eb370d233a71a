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
constexpr char FORCE_MARKER[] = "/.force_clean_all_disk";
const STEPS NO_TYPE = {{"<11>arrayctl.cpp:# Failed to get format type"}};
const STEPS LISTED = Listed(BLANK);
const STEPS EXAMINED_MD2 = {{"/sbin/mdadm -E /dev/@3", {.szOut = Examination(2)}}};
const STEPS NOT_EXAMINED = {{"/sbin/mdadm -E /dev/@3", {.status = 1}},
                            {"/sbin/mdadm -E /dev/@5", {.status = 1}}};

// A running system array of layout 8, so that no disk is asked for the wanted layout. Its disk is
// on no port.
MACHINE MachineOfEight(std::map<std::string, DISK_PLACES> disks,
                       const std::string &szConf = CONF_RAID)
{
    disks["sdz"] = PLACES_8;
    MACHINE machine = MachineOfDisks(disks, szConf);
    SystemArrayAdd(machine, {{"sdz1"}});
    return machine;
}

// One run; with no word of its own both words on a machine with one head.
void ExpectNumbers(DISKS_CASE row)
{
    if (!row.arguments.empty()) {
        ExpectDisks(row);
        return;
    }
    for (const char *const szWord : {WORD, WORD_DUAL_HEAD}) {
        SCOPED_TRACE(szWord);
        row.arguments = {szWord};
        ExpectDisks(row);
    }
}

struct FormatAll : testing::TestWithParam<DISKS_CASE> {
};

TEST_P(FormatAll, Prints)
{
    ExpectNumbers(GetParam());
}

// ---- which disks -------------------------------------------------------------------------------

const DISKS_CASE DISK_CASES[] = {
    {.szName = "NothingWithoutADisk", .machine = MachineOfDisks({{"sde", BLANK}})}, // USB
    {.szName = "EveryBlankDisk",
     .disks = OnEach({"sda", "sdb", "sdd"}, LISTED),
     .szOut = "1 2 4 ",
     .status = 3},
    {.szName = "EveryBlankDiskWhateverFollows",
     .disks = OnEach({"sda", "sdb", "sdd"}, LISTED),
     .arguments = {WORD, "further", "arguments"},
     .szOut = "1 2 4 ",
     .status = 3},
    {.szName = "TheBlankDiskBesideACurrentOne",
     .disks = {{"sda", Listed(PLACES_8)}, {"sdb", LISTED}},
     .machine = MachineOfEight({{"sda", PLACES_8}}),
     .szOut = "2 ",
     .status = 1},
    {.szName = "NoUnrecognisedDiskBesideACurrentOne",
     .disks = {{"sda", Listed(PLACES_8)}, {"sdb", Listed(PLACES_FOREIGN)}},
     .machine = MachineOfEight({{"sda", PLACES_8}, {"sdb", PLACES_FOREIGN}})},
    // An upgrade keeps the data of the second.
    {.szName = "NoCurrentDisk",
     .disks = {{"sda", Listed(PLACES_8)}, {"sdb", Listed(PLACES_7)}},
     .machine = MachineOfEight({{"sda", PLACES_8}, {"sdb", PLACES_7}})},
    // Unrecognised disks and those that an array holds too: the whole list.
    {.szName = "EveryDiskWithoutACurrentOne",
     .disks = {{"sda", Listed(PLACES_FOREIGN)},
               {"sdb", Listed(PLACES_6) + EXAMINED_MD2},
               {"sdc", LISTED}},
     .errors = NO_TYPE,
     .machine = MachineOfEight({{"sda", PLACES_FOREIGN}, {"sdb", PLACES_6}}),
     .szOut = "1 2 3 ",
     .status = 3},
    {.szName = "NoDiskOfAnotherLayoutThatAnArrayHolds",
     .disks = {{"sda", Listed(PLACES_8)},
               {"sdb", Listed(PLACES_6) + EXAMINED_MD2},
               {"sdc", Listed(PLACES_6) + NOT_EXAMINED}},
     .errors = NO_TYPE,
     .machine = MachineOfEight({{"sda", PLACES_8}, {"sdb", PLACES_6}, {"sdc", PLACES_6}}),
     .szOut = "3 ",
     .status = 1},
    {.szName = "EveryDiskWhereTheMarkerStands",
     .machine = WithFile(
         MachineOfEight(
             {{"sda", PLACES_8}, {"sdb", PLACES_6}, {"sdc", PLACES_FOREIGN}, {"sdd", BLANK}}),
         FORCE_MARKER, ""),
     .szOut = "1 2 3 4 ",
     .status = 4},
    // None at all, and fewer, are sizes like any: the disk is not blank.
    {.szName = "NoDiskWithAPartitionOfWhateverSize",
     .disks = {{"sda", Listed(PLACES_8)},
               {"sdb",
                {{LISTED[0].szText, {.szOut = "/dev/sdb1 1 2 -2 83\n"}},
                 {LISTED[1].szText, {.szOut = "/dev/sdb2 1 2 -7 83\n"}}}},
               {"sdc", {{LISTED[0].szText, {.szOut = "/dev/sdc1 1 2 0 83\n"}}, LISTED[1]}},
               {"sdd", LISTED}},
     .machine = MachineOfEight({{"sda", PLACES_8}}),
     .szOut = "4 ",
     .status = 1},
    // The layout of the first disk is wanted, where the preparing command would take the biggest.
    {.szName = "ADiskWithoutTheLayoutOfTheFirstOne",
     .disks = {{"sda", EXAMINED_MD2 + Listed(PLACES_6)}, {"sdb", Listed(PLACES_8) + NOT_EXAMINED}},
     .machine = MachineOfDisks({{"sda", PLACES_6}, {"sdb", PLACES_8}}),
     .szOut = "2 ",
     .status = 1},
    // Seven is wanted, and no disk of it is known.
    {.szName = "EveryDiskOfABuiltInStorage",
     .disks = {{"sda", Listed(PLACES_BUILDIN)}, {"sdb", LISTED}},
     .machine = MachineOfDisks({{"sda", PLACES_BUILDIN}}, CONF_BUILDIN),
     .szOut = "1 2 ",
     .status = 2},
    // The third has no layout of RAID machines.
    {.szName = "TheBlankDiskWithoutRaid",
     .disks = {{"sda", Listed(PLACES_8)}, {"sdb", LISTED}, {"sdc", Listed(PLACES_3_NO_RAID)}},
     .machine = MachineOfDisks({{"sda", PLACES_8}, {"sdc", PLACES_3_NO_RAID}}, CONF_NO_RAID),
     .szOut = "2 ",
     .status = 1},
    {.szName = "NothingWithoutTheModelsFile",
     .errors = 2 * STEPS{{"<11>disk_port.cpp:# Get usbportcfg key from "
                          "/etc.defaults/nuroinfo.conf Error"}},
     .machine = Without(MachineOfDisks({{"sda", BLANK}}), "/etc.defaults")},
};

INSTANTIATE_TEST_SUITE_P(, FormatAll, testing::ValuesIn(DISK_CASES), ROW_NAME());

// ---- dual-head machines ------------------------------------------------------------------------

// The internal disk is left alone.
MACHINE MachineWithUnit(std::map<std::string, DISK_PLACES> disks = {})
{
    disks["sda"] = BLANK;
    MACHINE machine = MachineOfDisks(disks, CONF_DUAL_HEAD);
    ExpansionUnitAdd(machine, "host6", "/dev/sdga,/dev/sdgc");
    return machine;
}

const std::map<std::string, STEPS> ONE_OF_TWO = {{"sdga", EXAMINED_MD2 + Listed(PLACES_8)},
                                                 {"sdgc", LISTED}};

const DISKS_CASE HEAD_CASES[] = {
    {.szName = "TheNumbersOfAUnitsDisks", // 7 * 26 + 1
     .disks = OnEach({"sdga", "sdgc"}, LISTED),
     .machine = MachineWithUnit(),
     .arguments = {WORD},
     .szOut = "183 185 ",
     .status = 2},
    // Its name is part of those that the unit tells, and so it counts as one.
    {.szName = "TheNumberOfTheUnitsOwnPort",
     .disks = {{"sdg", LISTED}},
     .machine = MachineWithUnit(),
     .arguments = {WORD},
     .szOut = "7 ",
     .status = 1},
    {.szName = "AllInADualHeadInstallation",
     .disks = OnEach({"sdga", "sdgc"}, LISTED),
     .machine = MachineWithUnit(),
     .arguments = {WORD_DUAL_HEAD},
     .szOut = "all",
     .status = 2},
    {.szName = "AllForOneDiskOfTwoToo",
     .disks = ONE_OF_TWO,
     .machine = MachineWithUnit({{"sdga", PLACES_8}}),
     .arguments = {WORD_DUAL_HEAD},
     .szOut = "all",
     .status = 1},
    {.szName = "TheNumberOfOneDiskOfTwo",
     .disks = ONE_OF_TWO,
     .machine = MachineWithUnit({{"sdga", PLACES_8}}),
     .arguments = {WORD},
     .szOut = "185 ",
     .status = 1},
    {.szName = "NothingWithoutADiskOfAUnit",
     .machine = MachineWithUnit(),
     .arguments = {WORD_DUAL_HEAD}},
    {.szName = "NothingWithoutADiskOfAUnitToFormat",
     .disks = {{"sdga", EXAMINED_MD2 + Listed(PLACES_8)}},
     .machine = MachineWithUnit({{"sdga", PLACES_8}}),
     .arguments = {WORD_DUAL_HEAD}},
    {.szName = "AllWhereTheMarkerStands",
     .machine = WithFile(MachineWithUnit({{"sdga", BLANK}}), FORCE_MARKER, ""),
     .arguments = {WORD_DUAL_HEAD},
     .szOut = "all",
     .status = 1},
    {.szName = "TheNumberWhereTheMarkerStands",
     .machine = WithFile(MachineWithUnit({{"sdga", BLANK}}), FORCE_MARKER, ""),
     .arguments = {WORD},
     .szOut = "183 ",
     .status = 1},
    {.szName = "AllWhereAMarkerTellsOfTwoHeads",
     .disks = {{"sdga", LISTED}},
     .machine = With(MachineOfDisks({{"sda", BLANK}}),
                     [](MACHINE &machine) {
                         MachineFile(machine, "/tmp/.dualhead", "");
                         ExpansionUnitAdd(machine, "host6", "/dev/sdga");
                     }),
     .arguments = {WORD_DUAL_HEAD},
     .szOut = "all",
     .status = 1},
    {.szName = "TheNumberWhereAMarkerTellsOfOneHead",
     .disks = {{"sda", LISTED}},
     .machine = WithFile(MachineWithConf(CONF_DUAL_HEAD), "/tmp/.not.dualhead", ""),
     .arguments = {WORD_DUAL_HEAD},
     .szOut = "1 ",
     .status = 1},
};

INSTANTIATE_TEST_SUITE_P(DualHead, FormatAll, testing::ValuesIn(HEAD_CASES), ROW_NAME());

// ---- the exit status ---------------------------------------------------------------------------

// Disks that all have the letter of sda, which is what makes them internal and gives their number.
MACHINE MachineWithManyDisks(int nDisk)
{
    MACHINE machine = WithFile(MachineOfEight({}), FORCE_MARKER, "");
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
    RunEnds(MachineWithManyDisks(255), {WORD}, 255, Ones(255));
    RunEnds(MachineWithManyDisks(256), {WORD}, 0, Ones(256));
    RunEnds(MachineWithManyDisks(300), {WORD}, 44, Ones(300));
}

// ---- failures ----------------------------------------------------------------------------------

struct FAULT_CASE {
    const char *szName;
    MACHINE machine;
    const char *szWord;
    int nGlob;
    STEPS log;
};

STEPS Unread(const std::string &szDevices)
{
    return {{"<11>disk_port.cpp:# read error :/sys/block/sd*"},
            {"<11>arrayctl.cpp:# Failed to enum " + szDevices}};
}

// Even without a disk the layout is asked for: before the list is looked at.
TEST(FormatAllFails, WhenDisksOrLayoutAreNotFound)
{
    const MACHINE one = MachineOfDisks({{"sda", BLANK}});
    const STEPS noLayout = {{"<11>arrayctl.cpp:# Failed to find partition layout"}};
    const FAULT_CASE cases[] = {
        {"internal", one, WORD, 1, Unread("INTERNAL_DEVICE")},
        {"unit", MachineWithUnit(), WORD, 1, Unread("EUNIT_DEVICE")},
        {"layout", one, WORD_DUAL_HEAD, 2, noLayout},
        {"layout without a disk", MachineWithConf(CONF_RAID), WORD_DUAL_HEAD, 2, noLayout},
    };
    for (const FAULT_CASE &row : cases) {
        ExpectRun({.szName = row.szName,
                   .machine = WithFault(row.machine,
                                        {.szFunction = "glob", .nCall = row.nGlob, .error = EIO}),
                   .arguments = {row.szWord},
                   .status = 1,
                   .steps = STEPS{{"fault glob " + std::to_string(row.nGlob)}} + row.log});
    }
}

constexpr char NO_FORK[] = "<11>process.cpp:# fork error, errno=Resource temporarily unavailable\n"
                           "<11>arrayctl.cpp:# Failed to fork.\n";

TEST(FormatAllFails, AtOnceWhenAChildCannotBeForked)
{
    MACHINE machine = MachineOfDisks({{"sda", BLANK}, {"sdb", BLANK}});
    MachineTool(machine, "/sbin/sfdisk -l ...", {.nMeet = NEVER, .nTimes = ANY_TIMES});
    machine.fMayLeaveChildren = true; // the first is not waited for
    for (const int nCall : {1, 2}) {
        machine.faults = {{.szFunction = "fork", .nCall = nCall, .error = EAGAIN}};
        EXPECT_EQ(LogErrors(RunEnds(machine, {WORD}, 1, "")), NO_FORK);
    }
}

constexpr char CONF_USB_0[] = "supportraid=yes\nsupport_buildin_storage=no\nusbportcfg=0\n"
                              "internalportcfg=0xf\n";

// The disk whose number cannot be told is told as 0: its port is looked up anew, because the mask
// of the USB ports is 0, and the model's file is away by then.
TEST(FormatAllFails, ToNumberADiskWhosePortIsUnknown)
{
    MACHINE machine = MachineOfDisks({{"sda", BLANK}, {"sdb", BLANK}}, CONF_USB_0);
    for (const char *const szDisk : {"sda", "sdb"}) {
        MachineTool(machine, ListingCommand(szDisk, 1));
        MachineTool(machine, ListingCommand(szDisk, 2),
                    {.removes = {"/etc.defaults/nuroinfo.conf"}});
    }
    const RUN_RESULT result = RunEnds(machine, {WORD}, 2, "0 0 ");
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
    MACHINE machine = MachineOfDisks({{"sda", BLANK}, {"sdb", BLANK}}, CONF_USB_0);
    MachineFile(machine, FORCE_MARKER, "");
    machine.fCallsTold = true;
    RunEnds(machine, {WORD}, 2, "1 2 ");
    const std::vector<std::string> calls = MachineCalls();
    const auto nOpened = std::count_if(calls.begin(), calls.end(), [](const std::string &szCall) {
        return szCall.rfind("0 fopen ", 0) == 0;
    });
    machine.faults = {{.szFunction = "fopen",
                       .nCall = static_cast<int>(nOpened) - 3,
                       .error = EMFILE,
                       .szProcess = "0"}};
    const RUN_RESULT result = RunEnds(machine, {WORD}, 2, "1 0 ");
    EXPECT_EQ(LogOf(result, "arrayctl.cpp"), "<11>arrayctl.cpp:# DiskPathParse(/dev/sdb) fail\n");
}

TEST(FormatAllFails, WithoutMemory)
{
    const MACHINE machine = WithFile(MachineOfEight({{"sda", BLANK}}), FORCE_MARKER, "");
    EXPECT_GE(RunsWithoutMemory(machine, WORD, NO_MEMORY_FOR_LIST), 3);
    EXPECT_GE(RunsWithoutMemory(machine, WORD, "<11>arrayctl.cpp:# Failed to alloc\n"), 1);
}

// Forty names that make a list of 1024 bytes grow; the disks decide themselves at once.
TEST(FormatAllFails, WhenTheListOfDisksToFormatCannotGrow)
{
    bool fSeen = false;
    for (int nCall = 1; nCall <= 400 && !fSeen; nCall++) {
        MACHINE machine = WithFile(MachineOfEight({}), FORCE_MARKER, "");
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

MACHINE MachineOfKilled(const MACHINE &machine)
{
    return With(machine, [](MACHINE &killed) { killed.fMayLeaveChildren = true; });
}

const DISKS_CASE CHILD_CASES[] = {
    {.szName = "SideBySide",
     .disks = OnEach({"sda", "sdb", "sdc", "sdd"}, {{LISTED[0].szText, {.nMeet = 4}}, LISTED[1]}),
     .arguments = {WORD},
     .szOut = "1 2 3 4 ",
     .status = 4},
    // A killed child is no disk of either list, and the others go on; its partitioner is left.
    {.szName = "NoDiskWhoseChildIsKilled",
     .disks = {{"sda", Listed(PLACES_8)},
               {"sdb", {{LISTED[0].szText, {.signalCaller = SIGKILL, .msDelay = 1000}}}},
               {"sdc", {{LISTED[0].szText, {.signalCaller = SIGTERM}}}},
               {"sdd", LISTED}},
     .errors = {{"<11>arrayctl.cpp:# Child exit not normally, pid: # disk: sdb"},
                {"<11>arrayctl.cpp:# Child exit not normally, pid: # disk: sdc"}},
     .machine = MachineOfKilled(MachineOfEight({{"sda", PLACES_8}})),
     .arguments = {WORD},
     .szOut = "4 ",
     .status = 1},
    {.szName = "NoDiskThatCannotBeWaitedFor",
     .disks = {{"sda", Listed(PLACES_8)}, {"sdb", LISTED}, {"sdc", LISTED}},
     .beside = {{"fault waitpid \"2 0 -\""}},
     .errors = {{"<11>arrayctl.cpp:# Wait pid failed. pid: # disk: sdb"}},
     .machine = WithFault(MachineOfKilled(MachineOfEight({{"sda", PLACES_8}})),
                          {.szFunction = "waitpid", .nCall = 2, .error = ECHILD, .szProcess = "0"}),
     .arguments = {WORD},
     .szOut = "3 ",
     .status = 1},
    // Nothing but questions goes to the disks.
    {.szName = "ADiskThatIsNotChanged",
     .disks = {{"sda", Listed(PLACES_6) + NOT_EXAMINED}},
     .machine = MachineOfEight({{"sda", PLACES_6}}),
     .arguments = {WORD},
     .szOut = "1 ",
     .status = 1},
};

INSTANTIATE_TEST_SUITE_P(Children, FormatAll, testing::ValuesIn(CHILD_CASES), ROW_NAME());

} // namespace
