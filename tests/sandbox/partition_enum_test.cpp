// SPDX-License-Identifier: MIT
#include "nurostoragecore/partition_enum.h"

#include "removal_machine.h"

#include <gtest/gtest.h>
#include <optional>
#include <ostream>
#include <string>
#include <vector>

namespace
{

constexpr char HEADING[] = "major minor  #blocks  name\n\n";

// Ports: sda to sdd internal, sde and sdf USB, sdg and sdh eSATA, sdi cache.
constexpr char CONF_PORTS[] = "maxdisks=4\n"
                              "internalportcfg=0xf\n"
                              "usbportcfg=0x30\n"
                              "esataportcfg=0xc0\n"
                              "cacheportcfg=0x100\n";

MACHINE MachineWithNames(const std::vector<std::string> &names)
{
    MACHINE machine = MachineMake();
    MachineConf(machine, CONF_PORTS);
    std::string szText = HEADING;
    for (const std::string &szName : names) {
        szText += "   8        1     524288 " + szName + "\n";
    }
    MachineFile(machine, "/proc/partitions", szText);
    return machine;
}

// One path a line.
std::string ListText(const NLIBSZLIST *pList)
{
    std::string szText;
    for (int i = 0; i < pList->nItem; i++) {
        szText += std::string(NLIBCSzListGet(pList, i)) + "\n";
    }
    return szText;
}

// Sixteen partitions on each of 26 disks.
std::vector<std::string> ManyNames()
{
    std::vector<std::string> names;
    for (char ch = 'a'; ch <= 'z'; ch++) {
        for (int i = 10; i < 26; i++) {
            names.push_back(std::string("sd") + ch + std::to_string(i));
        }
    }
    return names;
}

std::string ManyPaths()
{
    std::string szPaths = "/dev/name\n";
    for (const std::string &szName : ManyNames()) {
        szPaths += "/dev/" + szName + "\n";
    }
    return szPaths;
}

struct ENUM_CASE {
    const char *szName;
    MACHINE machine;
    std::optional<PARTITION_ENUM_FILTER> filter;
    int result;
    std::string szList;
    STEPS steps = {};
    std::vector<std::string> before = {}; // stands in the list when the call is made
    u32 code = OLD_CODE;
    int fMode = 1;
};

void PrintTo(const ENUM_CASE &row, std::ostream *pStream)
{
    *pStream << row.szName;
}

struct PartitionPathEnumRows : testing::TestWithParam<ENUM_CASE> {
};

TEST_P(PartitionPathEnumRows, Lists)
{
    const ENUM_CASE &row = GetParam();
    const RUN_RESULT result = MachineCall(row.machine, [&row] {
        PNLIBSZLIST pList = NLIBCSzListAlloc(512);
        for (const std::string &szItem : row.before) {
            (void)NLIBCSzListPush(&pList, szItem.c_str());
        }
        EXPECT_FAILS(PartitionPathEnum(row.filter ? &*row.filter : nullptr, &pList), row.result,
                     row.code);
        EXPECT_EQ(ListText(pList), row.szList);
        EXPECT_EQ(pList->fMode, row.fMode);
        NLIBCSzListFree(pList);
    });
    ExpectSteps(result, row.steps);
}

constexpr PARTITION_ENUM_FILTER SD = {"sd", 0};
const std::vector<std::string> PREFIXED = {"sda", "sda1", "isda1", "sd", "s", "Sda", "md~5"};
constexpr char ALL_PREFIXED[] = "/dev/Sda\n/dev/isda1\n/dev/md~5\n/dev/name\n/dev/s\n/dev/sd\n"
                                "/dev/sda\n/dev/sda1\n";
const std::vector<std::string> ON_PORTS = {"sda", "sda1", "sda5", "sdb",  "sdb5",
                                           "sde", "sde1", "sdg1", "sdi1", "sdq"};
const std::vector<std::string> MMC = {"sda1", "mmcblk0", "mmcblk0p1"};
const std::string LONG_NAME(58, 'x');

// A list of the kernel with this text.
MACHINE MachineOfText(const std::string &szText)
{
    return WithFile(MachineMake(), "/proc/partitions", szText);
}

const ENUM_CASE ENUM_CASES[] = {
    {"EveryDeviceInByteOrder",
     MachineWithNames({"sdb", "sdb1", "sda", "sda2", "sda10", "md2", "mmcblk0p1"}),
     {},
     8,
     "/dev/md2\n/dev/mmcblk0p1\n/dev/name\n/dev/sda\n/dev/sda10\n/dev/sda2\n/dev/sdb\n"
     "/dev/sdb1\n"},
    {"TheHeadingAsALineLikeAnyOther", MachineWithNames({}), {}, 1, "/dev/name\n"},
    {"NoHeadingOfAnotherPrefix", MachineWithNames({}), SD, 0, ""},
    // The count is that of the whole list.
    {"WhatIsThereToo",
     MachineWithNames({"sda", "sda1", "sda2"}),
     SD,
     5,
     "/dev/md0\n/dev/sda\n/dev/sda1\n/dev/sda2\n/dev/sdz\n",
     {},
     {"/dev/sdz", "/dev/md0"}},
    {"ADeviceThatIsListedTwice",
     MachineWithNames({"sda", "sda"}),
     SD,
     3,
     "/dev/sda\n/dev/sda\n/dev/sda\n",
     {},
     {"/dev/sda"}},
    {"NamesThatBeginWithThePrefix", MachineWithNames(PREFIXED), SD, 3,
     "/dev/sd\n/dev/sda\n/dev/sda1\n"},
    {"AllOfAnEmptyPrefix", MachineWithNames(PREFIXED), {{"", 0}}, 8, ALL_PREFIXED},
    {"AllOfNoPrefix", MachineWithNames(PREFIXED), {{nullptr, 0}}, 8, ALL_PREFIXED},
    {"Internal",
     MachineWithNames(ON_PORTS),
     {{"sd", 1}},
     5,
     "/dev/sda\n/dev/sda1\n/dev/sda5\n/dev/sdb\n/dev/sdb5\n"},
    {"Usb", MachineWithNames(ON_PORTS), {{"sd", 4}}, 3, "/dev/sde\n/dev/sde1\n/dev/sdq\n"},
    {"EsataOrCache", MachineWithNames(ON_PORTS), {{"sd", 8 | 32}}, 2, "/dev/sdg1\n/dev/sdi1\n"},
    {"Eunit", MachineWithNames(ON_PORTS), {{"sd", 2}}, 0, ""},
    {"ThePrefixFirst", MachineWithNames(MMC), {{"sd", 1}}, 1, "/dev/sda1\n"},
    {"NoDeviceWithoutAContainer",
     MachineWithNames(MMC),
     {{"mmcblk", 0xFFFFFFFF}},
     0,
     "",
     {{"<15>partition_enum.cpp:# Failed to parsing device: mmcblk0"},
      {"<15>partition_enum.cpp:# Failed to parsing device: mmcblk0p1"}}},
    {"DevicesWithoutAContainerWhereNoneIsAsked",
     MachineWithNames(MMC),
     {{"mmcblk", 0}},
     2,
     "/dev/mmcblk0\n/dev/mmcblk0p1\n"},
    {"LinesOfFourFieldsAlone", // behind a blank the line end is a fifth one
     MachineOfText("8 0 1\n8 0 1 sda\n\t8\t1 \t 1  sda1\n8 0 1 sdb 5\n8 0 1 sdc \nsdd\n\n"),
     {},
     2,
     "/dev/sda\n/dev/sda1\n"},
    {"TheLastCharacterAsTheLineEnd",
     MachineOfText("8 0 1 sda\n8 1 1 sda12"),
     {},
     2,
     "/dev/sda\n/dev/sda1\n"},
    {"PathsOf62Characters",
     MachineWithNames({LONG_NAME.substr(1)}),
     {},
     2,
     "/dev/name\n/dev/" + LONG_NAME.substr(1) + "\n"},
    {"PathsOf63Characters",
     MachineWithNames({LONG_NAME}),
     {},
     2,
     "/dev/name\n/dev/" + LONG_NAME + "\n"},
    {"NoMoreThan63Characters",
     MachineWithNames({LONG_NAME + std::string(42, 'x')}),
     {},
     2,
     "/dev/name\n/dev/" + LONG_NAME + "\n"},
    {"ManyDevices", MachineWithNames(ManyNames()), {}, 417, ManyPaths()},
    {"NothingWithoutTheKernelsList",
     Without(MachineMake(), "/proc/partitions"),
     {},
     -1,
     "/dev/sda\n/dev/sdb\n",
     {{"<11>partition_enum.cpp:# Failed to read line of /proc/partitions, errno=0x900"}},
     {"/dev/sdb", "/dev/sda"},
     ERR_OPEN_FAILED},
    {"NothingOfAnEmptyList",
     MachineOfText(""),
     {},
     -1,
     "",
     {{"<11>partition_enum.cpp:# There's no line in /proc/partitions"}}},
};

INSTANTIATE_TEST_SUITE_P(, PartitionPathEnumRows, testing::ValuesIn(ENUM_CASES), ROW_NAME());

TEST(PartitionPathEnum, AListThatCannotBeReadToItsEndFails)
{
    MACHINE machine = MachineMake();
    MachineRemove(machine, "/proc/partitions");
    MachineFolder(machine, "/proc/partitions");
    const RUN_RESULT result = MachineCall(machine, [] {
        PNLIBSZLIST pList = NLIBCSzListAlloc(512);
        NLIBCErrSet(ERR_NO_MEMBER_DISK, "before", 1);
        EXPECT_EQ(PartitionPathEnum(nullptr, &pList), -1);
        EXPECT_EQ(pList->nItem, 0);
        NLIBCSzListFree(pList);
    });
    EXPECT_EQ(LogText(result),
              "<11>partition_enum.cpp:# Failed to read line of /proc/partitions, errno=0x6100\n");
}

// Both work lists, and the result in its old order.
TEST(PartitionPathEnum, WithoutMemoryForItsListsFails)
{
    for (const int nCall : {1, 2}) {
        MACHINE machine = MachineWithNames({"sda"});
        machine.faults = {{.szFunction = "malloc", .nCall = nCall}};
        PNLIBSZLIST pList = NLIBCSzListAlloc(512);
        (void)NLIBCSzListPush(&pList, "/dev/sdz");
        (void)NLIBCSzListPush(&pList, "/dev/sdy");
        const RUN_RESULT result = MachineCall(machine, [&pList] {
            EXPECT_EQ(PartitionPathEnum(nullptr, &pList), -1);
            EXPECT_EQ(NLIBCErrGet(), ERR_OUT_OF_MEMORY);
            EXPECT_EQ(ListText(pList), "/dev/sdz\n/dev/sdy\n");
            EXPECT_EQ(pList->fMode, 0);
        });
        NLIBCSzListFree(pList);
        EXPECT_EQ(LogText(result), "<11>partition_enum.cpp:# Failed to allocate for partition "
                                   "list, errno=0x200\n");
        EXPECT_EQ(TranscriptText(result), "fault malloc " + std::to_string(nCall) + "\n");
    }
}

// The heading, an empty line, sda and sdb: what was added before stays.
TEST(PartitionPathEnum, WithoutMemoryForALineFails)
{
    const char *const ADDED[] = {"", "/dev/name\n", "/dev/name\n", "/dev/name\n/dev/sda\n"};
    for (int nCall = 1; nCall <= 4; nCall++) {
        MACHINE machine = MachineWithNames({"sda", "sdb"});
        machine.faults = {{.szFunction = "strdup", .nCall = nCall}};
        const char *const szAdded = ADDED[nCall - 1];
        QuietCall(machine, [szAdded] {
            PNLIBSZLIST pList = NLIBCSzListAlloc(512);
            EXPECT_EQ(PartitionPathEnum(nullptr, &pList), -1);
            EXPECT_EQ(NLIBCErrGet(), ERR_OUT_OF_MEMORY);
            EXPECT_EQ(ListText(pList), szAdded);
            NLIBCSzListFree(pList);
        });
    }
}

} // namespace
