// SPDX-License-Identifier: MIT
#include "nurostoragecore/partition_enum.h"

#include "removal_machine.h"

#include <gtest/gtest.h>
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

struct ENUM_CASE {
    const PARTITION_ENUM_FILTER *pFilter;
    int result;
    std::string szList;
    std::string szLog = "";
};

// `before` stands in the list when the call is made.
void EnumGives(const MACHINE &machine, const ENUM_CASE &row,
               const std::vector<std::string> &before = {})
{
    const RUN_RESULT result = MachineCall(machine, [&] {
        PNLIBSZLIST pList = NLIBCSzListAlloc(512);
        for (const std::string &szItem : before) {
            (void)NLIBCSzListPush(&pList, szItem.c_str());
        }
        EXPECT_EQ(PartitionPathEnum(row.pFilter, &pList), row.result);
        EXPECT_EQ(ListText(pList), row.szList);
        EXPECT_EQ(pList->fMode, 1);
        NLIBCSzListFree(pList);
    });
    EXPECT_EQ(LogText(result), row.szLog);
    EXPECT_EQ(TranscriptText(result), "");
}

TEST(PartitionPathEnum, ListsEveryDeviceInByteOrder)
{
    EnumGives(MachineWithNames({"sdb", "sdb1", "sda", "sda2", "sda10", "md2", "mmcblk0p1"}),
              {nullptr, 8,
               "/dev/md2\n/dev/mmcblk0p1\n/dev/name\n/dev/sda\n/dev/sda10\n/dev/sda2\n/dev/sdb\n"
               "/dev/sdb1\n"});
}

TEST(PartitionPathEnum, TheHeadingIsALineLikeAnyOther)
{
    EnumGives(MachineWithNames({}), {nullptr, 1, "/dev/name\n"});
    constexpr PARTITION_ENUM_FILTER SD = {"sd", 0};
    EnumGives(MachineWithNames({}), {&SD, 0, ""});
}

TEST(PartitionPathEnum, TheCountIsThatOfTheWholeList)
{
    constexpr PARTITION_ENUM_FILTER SD = {"sd", 0};
    EnumGives(MachineWithNames({"sda", "sda1", "sda2"}),
              {&SD, 5, "/dev/md0\n/dev/sda\n/dev/sda1\n/dev/sda2\n/dev/sdz\n"},
              {"/dev/sdz", "/dev/md0"});
}

TEST(PartitionPathEnum, KeepsADeviceThatIsListedTwice)
{
    constexpr PARTITION_ENUM_FILTER SD = {"sd", 0};
    EnumGives(MachineWithNames({"sda", "sda"}), {&SD, 3, "/dev/sda\n/dev/sda\n/dev/sda\n"},
              {"/dev/sda"});
}

TEST(PartitionPathEnum, TakesTheNamesThatBeginWithThePrefix)
{
    const MACHINE machine = MachineWithNames({"sda", "sda1", "isda1", "sd", "s", "Sda", "md~5"});
    constexpr PARTITION_ENUM_FILTER SD = {"sd", 0};
    EnumGives(machine, {&SD, 3, "/dev/sd\n/dev/sda\n/dev/sda1\n"});
    constexpr PARTITION_ENUM_FILTER ALL = {"", 0};
    EnumGives(machine, {&ALL, 8,
                        "/dev/Sda\n/dev/isda1\n/dev/md~5\n/dev/name\n/dev/s\n/dev/sd\n/dev/sda\n"
                        "/dev/sda1\n"});
    constexpr PARTITION_ENUM_FILTER NO_PREFIX = {nullptr, 0};
    EnumGives(machine, {&NO_PREFIX, 8,
                        "/dev/Sda\n/dev/isda1\n/dev/md~5\n/dev/name\n/dev/s\n/dev/sd\n/dev/sda\n"
                        "/dev/sda1\n"});
}

TEST(PartitionPathEnum, TakesTheContainersOfTheMask)
{
    const MACHINE machine = MachineWithNames(
        {"sda", "sda1", "sda5", "sdb", "sdb5", "sde", "sde1", "sdg1", "sdi1", "sdq"});
    constexpr PARTITION_ENUM_FILTER INTERNAL = {"sd", 1};
    EnumGives(machine, {&INTERNAL, 5, "/dev/sda\n/dev/sda1\n/dev/sda5\n/dev/sdb\n/dev/sdb5\n"});
    constexpr PARTITION_ENUM_FILTER USB = {"sd", 4};
    EnumGives(machine, {&USB, 3, "/dev/sde\n/dev/sde1\n/dev/sdq\n"});
    constexpr PARTITION_ENUM_FILTER ESATA_OR_CACHE = {"sd", 8 | 32};
    EnumGives(machine, {&ESATA_OR_CACHE, 2, "/dev/sdg1\n/dev/sdi1\n"});
    constexpr PARTITION_ENUM_FILTER EUNIT = {"sd", 2};
    EnumGives(machine, {&EUNIT, 0, ""});
}

TEST(PartitionPathEnum, ADeviceWithoutAContainerIsTold)
{
    const MACHINE machine = MachineWithNames({"sda1", "mmcblk0", "mmcblk0p1"});
    constexpr PARTITION_ENUM_FILTER SD = {"sd", 1};
    EnumGives(machine, {&SD, 1, "/dev/sda1\n"}); // the prefix comes first
    constexpr PARTITION_ENUM_FILTER MMC = {"mmcblk", 0xFFFFFFFF};
    EnumGives(machine, {&MMC, 0, "",
                        "<15>partition_enum.cpp:# Failed to parsing device: mmcblk0\n"
                        "<15>partition_enum.cpp:# Failed to parsing device: mmcblk0p1\n"});
    constexpr PARTITION_ENUM_FILTER MMC_NO_MASK = {"mmcblk", 0};
    EnumGives(machine, {&MMC_NO_MASK, 2, "/dev/mmcblk0\n/dev/mmcblk0p1\n"});
}

TEST(PartitionPathEnum, TakesLinesOfFourFieldsAlone)
{
    MACHINE machine = MachineMake();
    MachineFile(machine, "/proc/partitions",
                "8 0 1\n"
                "8 0 1 sda\n"
                "\t8\t1 \t 1  sda1\n"
                "8 0 1 sdb 5\n"
                "8 0 1 sdc \n" // the line end is a fifth field
                "sdd\n"
                "\n");
    EnumGives(machine, {nullptr, 2, "/dev/sda\n/dev/sda1\n"});
}

TEST(PartitionPathEnum, TheLastCharacterIsTakenForTheLineEnd)
{
    MACHINE machine = MachineMake();
    MachineFile(machine, "/proc/partitions", "8 0 1 sda\n8 1 1 sda12");
    EnumGives(machine, {nullptr, 2, "/dev/sda\n/dev/sda1\n"});
}

TEST(PartitionPathEnum, CutsAPathToSixtyThreeCharacters)
{
    const std::string szLong(100, 'x');
    EnumGives(MachineWithNames({szLong.substr(0, 57)}),
              {nullptr, 2, "/dev/name\n/dev/" + szLong.substr(0, 57) + "\n"});
    EnumGives(MachineWithNames({szLong.substr(0, 58)}),
              {nullptr, 2, "/dev/name\n/dev/" + szLong.substr(0, 58) + "\n"});
    EnumGives(MachineWithNames({szLong}),
              {nullptr, 2, "/dev/name\n/dev/" + szLong.substr(0, 58) + "\n"});
}

TEST(PartitionPathEnum, ManyDevices)
{
    std::vector<std::string> names;
    std::string szExpected = "/dev/name\n";
    for (char ch = 'a'; ch <= 'z'; ch++) {
        for (int i = 10; i < 26; i++) {
            names.push_back(std::string("sd") + ch + std::to_string(i));
            szExpected += "/dev/" + names.back() + "\n";
        }
    }
    EnumGives(MachineWithNames(names), {nullptr, 417, szExpected});
}

TEST(PartitionPathEnum, WithoutAListFails)
{
    const RUN_RESULT result = MachineCall(MachineWithNames({"sda"}), [] {
        RecordReset();
        EXPECT_EQ(PartitionPathEnum(nullptr, nullptr), -1);
        PNLIBSZLIST pNone = nullptr;
        EXPECT_EQ(PartitionPathEnum(nullptr, &pNone), -1);
        EXPECT_EQ(pNone, nullptr);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
    EXPECT_EQ(LogText(result), "<11>partition_enum.cpp:# bad parameters\n"
                               "<11>partition_enum.cpp:# bad parameters\n");
}

TEST(PartitionPathEnum, WithoutTheKernelsListFails)
{
    MACHINE machine = MachineMake();
    MachineRemove(machine, "/proc/partitions");
    EnumGives(machine,
              {nullptr, -1, "/dev/sda\n/dev/sdb\n",
               "<11>partition_enum.cpp:# Failed to read line of /proc/partitions, errno=0x900\n"},
              {"/dev/sdb", "/dev/sda"});
}

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

TEST(PartitionPathEnum, AnEmptyListFails)
{
    MACHINE machine = MachineMake();
    MachineFile(machine, "/proc/partitions", "");
    const RUN_RESULT result = MachineCall(machine, [] {
        PNLIBSZLIST pList = NLIBCSzListAlloc(512);
        EXPECT_QUIET(PartitionPathEnum(nullptr, &pList), -1);
        EXPECT_EQ(pList->nItem, 0);
        EXPECT_EQ(pList->fMode, 1);
        NLIBCSzListFree(pList);
    });
    EXPECT_EQ(LogText(result), "<11>partition_enum.cpp:# There's no line in /proc/partitions\n");
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
