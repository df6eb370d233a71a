// SPDX-License-Identifier: MIT
#include "nurostoragecore/partition_version.h"

#include "nurocore/error.h"
#include "nurostoragecore/partition_layout.h"
#include "storage_machine.h"

#include <cerrno>
#include <filesystem>
#include <gtest/gtest.h>
#include <map>
#include <ostream>
#include <string>
#include <vector>

namespace
{

STEP NotThere(const std::string &szDisk, int partNum)
{
    return {"<15>partition_layout.cpp:# " + szDisk + ": dont contain partition [" +
            std::to_string(partNum) + "]"};
}

STEPS Biggest(int version)
{
    return {{"<11>partition_version.cpp:# Choose biggest partition layout version " +
             std::to_string(version) + "."}};
}

// The superblock of partition 3 names md2.
STEP Member(const std::string &szDisk)
{
    return {"/sbin/mdadm -E /dev/" + szDisk + "3", {.szOut = Examination(2)}};
}

STEPS NoMember(const std::string &szDisk)
{
    return {{"/sbin/mdadm -E /dev/" + szDisk + "3", {.status = 1}},
            {"/sbin/mdadm -E /dev/" + szDisk + "5", {.status = 1}}};
}

MACHINE MachineOfArray(const std::map<std::string, DISK_PLACES> &disks,
                       const std::vector<MACHINE_MEMBER> &members,
                       const std::string &szConf = CONF_RAID)
{
    MACHINE machine = MachineOfDisks(disks, szConf);
    SystemArrayAdd(machine, members);
    return machine;
}

enum WANTED { FIRST, BIGGEST, EITHER };

// Each is asked in a process of its own, because what the model says is asked once in a process.
struct VERSION_CASE {
    const char *szName;
    MACHINE machine;
    WANTED wanted;
    u32 version;
    STEPS steps = {};
    int result = 0;
    u32 before = 0; // what the caller has
};

void PrintTo(const VERSION_CASE &row, std::ostream *pStream)
{
    *pStream << row.szName;
}

void ExpectVersion(const VERSION_CASE &row, int (*pAsk)(u32 *))
{
    MACHINE machine = row.machine;
    StepsExpect(machine, row.steps);
    ExpectSteps(MachineCall(machine,
                            [&row, pAsk] {
                                u32 version = row.before;
                                EXPECT_EQ(pAsk(&version), row.result);
                                EXPECT_EQ(version, row.version);
                            }),
                row.steps);
}

int BiggestGet(u32 *pVersion)
{
    return PartitionLayoutGetMax(pVersion, 1);
}

struct PartitionVersion : testing::TestWithParam<VERSION_CASE> {
};

TEST_P(PartitionVersion, Row)
{
    const VERSION_CASE &row = GetParam();
    if (row.wanted == FIRST) {
        ExpectVersion(row, PartitionLayoutGet);
        return;
    }
    if (row.wanted == EITHER) {
        ExpectVersion(row, [](u32 *pVersion) { return PartitionLayoutGetMax(pVersion, 0); });
    }
    ExpectVersion(row, BiggestGet);
}

const std::map<std::string, DISK_PLACES> THREE_WITHOUT_RAID = {
    {"sda", PLACES_6}, {"sdb", PLACES_7}, {"sdc", PLACES_3_NO_RAID}};
const std::string CONF_HEADS_NO_RAID = CONF_NO_RAID + "support_dual_head=yes\n";

MACHINE MachineWithUnit()
{
    MACHINE machine = MachineOfDisks({{"sda", PLACES_8}, {"sdga", PLACES_6}, {"sdgb", PLACES_7}},
                                     CONF_HEADS_NO_RAID);
    ExpansionUnitAdd(machine, "host6", "/dev/sdga,/dev/sdgb");
    return machine;
}

MACHINE WithGlobFault(const MACHINE &machine, int nCall)
{
    return WithFault(machine, {.szFunction = "glob", .nCall = nCall, .error = EIO});
}

const VERSION_CASE ARRAY_CASES[] = {
    {"IsThatOfTheRunningSystemArray", // sdc is not looked at
     MachineOfArray({{"sda", PLACES_2}, {"sdb", PLACES_2}, {"sdc", PLACES_7}},
                    {{"sda1"}, {"sdb1"}}),
     EITHER, 2},
    {"OfTheSystemArrayIsAlwaysThatOfARaidMachine",
     MachineOfArray({{"sda", PLACES_3_NO_RAID}}, {{"sda1"}}, CONF_NO_RAID), BIGGEST, 8},
    {"OfTheSystemArrayIsThatOfARaidMachineWithoutRaidToo",
     MachineOfArray({{"sda", PLACES_1}}, {{"sda1"}}, CONF_NO_RAID), BIGGEST, 1},
    {"IsTheNewestWhenNoMemberIsKnown", // sdb is no member
     MachineOfArray({{"sda", PLACES_FOREIGN}, {"sdb", PLACES_7}}, {{"sda1"}}), BIGGEST, 8},
    {"TakesAMembersNameWithoutItsLastCharacter",
     MachineOfArray({}, {{"sda10"}}),
     BIGGEST,
     8,
     {NotThere("sda1", 1)}},
    {"TakesAMembersNameBehindTheLastDash",
     MachineOfArray({}, {{"dm-01"}}),
     BIGGEST,
     8,
     {NotThere("0", 1)}},
    {"AMemberWithoutANameIsNoDisk",
     With(MachineWithConf(CONF_RAID),
          [](MACHINE &machine) { MachineFolder(machine, "/sys/block/md0/md/dev-"); }),
     BIGGEST,
     8,
     {NotThere("", 1)}},
    // Only a version that is still none becomes the newest.
    {"AVersionThatTheCallerHasStaysWhereNoMemberIsKnown",
     MachineOfArray({{"sda", PLACES_FOREIGN}}, {{"sda1"}}),
     BIGGEST,
     5,
     {},
     0,
     5},
    {"LooksAtTheDisksWhenTheSystemArrayHasNoMember",
     MachineOfArray({{"sda", PLACES_7}}, {}, CONF_NO_RAID), FIRST, 7},
    {"FailsWhenTheMembersCannotBeRead",
     WithGlobFault(MachineOfDisks({{"sda", PLACES_7}}, CONF_NO_RAID), 1),
     BIGGEST,
     0,
     {{"fault glob 1"}},
     -1},
};

const VERSION_CASE DISK_CASES[] = {
    {"IsTheNewestWithoutADisk", MachineWithConf(CONF_RAID), EITHER, 8},
    {"IsTheNewestWithoutAKnownDisk",
     MachineOfDisks(
         {{"sda", BLANK}, {"sdb", {PLACES_7.start, PLACES_7.size, 0, 0}}, {"sdc", PLACES_FOREIGN}}),
     EITHER,
     8,
     {NotThere("/dev/sda", 1), NotThere("/dev/sdb", 2)}},
    {"IsThatOfTheFirstDisk", MachineOfDisks(THREE_WITHOUT_RAID, CONF_NO_RAID), FIRST, 6},
    {"IsTheBiggest", MachineOfDisks(THREE_WITHOUT_RAID, CONF_NO_RAID), BIGGEST, 7, Biggest(7)},
    {"LogsTheBiggestOfOneDiskToo", MachineOfDisks({{"sdb", PLACES_2}}, CONF_NO_RAID), BIGGEST, 2,
     Biggest(2)},
    {"LeavesOtherPortsOut", // USB and eSATA
     MachineOfDisks({{"sdb", PLACES_6}, {"sde", PLACES_7}, {"sdg", PLACES_7}}, CONF_NO_RAID),
     BIGGEST, 6, Biggest(6)},
    {"KnowsABuiltInStorageAsSeven", MachineOfDisks({{"sda", PLACES_BUILDIN}}, CONF_BUILDIN),
     BIGGEST, 7, Biggest(7)},
    {"KnowsTheFirstBuiltInStorageAsSeven", MachineOfDisks({{"sda", PLACES_BUILDIN}}, CONF_BUILDIN),
     FIRST, 7},
    {"OfADualHeadMachineIsThatOfItsFirstUnit", MachineWithUnit(), FIRST, 6},
    {"OfADualHeadMachineIsTheBiggestOfItsUnits", MachineWithUnit(), BIGGEST, 7, Biggest(7)},
    {"FailsWhenTheDisksCannotBeEnumerated",
     WithGlobFault(MachineOfDisks({{"sda", PLACES_7}}, CONF_NO_RAID), 2),
     BIGGEST,
     0,
     {{"fault glob 2"}, {"<11>disk_port.cpp:# read error :/sys/block/sd*"}},
     -1},
};

// On a RAID machine the disk has to hold data.
const VERSION_CASE DATA_CASES[] = {
    {"CountsADiskWithItsArrayOnPartitionFive",
     MachineOfDisks({{"sda", PLACES_7}}),
     FIRST,
     7,
     {NoMember("sda")[0], {"/sbin/mdadm -E /dev/sda5", {.szOut = Examination(3)}}}},
    {"ForgetsADiskThatDoesNotCount", MachineOfDisks({{"sda", PLACES_6}}), EITHER, 8,
     NoMember("sda")},
    {"ForgetsADiskThatDoesNotCountBeforeTheFirst",
     MachineOfDisks({{"sda", PLACES_6}, {"sdb", PLACES_7}}), FIRST, 7,
     NoMember("sda") + STEPS{Member("sdb")}},
    {"ForgetsADiskThatDoesNotCountBeforeTheBiggest",
     MachineOfDisks({{"sda", PLACES_6}, {"sdb", PLACES_7}}), BIGGEST, 7,
     NoMember("sda") + STEPS{Member("sdb")} + Biggest(7)},
    {"KeepsTheBiggestWhateverTheOrder",
     MachineOfDisks({{"sda", PLACES_2}, {"sdb", PLACES_8}, {"sdc", PLACES_6}}), BIGGEST, 8,
     STEPS{Member("sda"), Member("sdb"), Member("sdc")} + Biggest(8)},
    {"StopsAtTheFirstDiskUnlessTheBiggestIsWanted",
     MachineOfDisks({{"sda", PLACES_2}, {"sdb", PLACES_8}}),
     FIRST,
     2,
     {Member("sda")}},
};

INSTANTIATE_TEST_SUITE_P(Array, PartitionVersion, testing::ValuesIn(ARRAY_CASES), ROW_NAME());
INSTANTIATE_TEST_SUITE_P(Disks, PartitionVersion, testing::ValuesIn(DISK_CASES), ROW_NAME());
INSTANTIATE_TEST_SUITE_P(Data, PartitionVersion, testing::ValuesIn(DATA_CASES), ROW_NAME());

TEST(PartitionVersionData, CountsMembersOfArraysUpToNinetyNine)
{
    const struct {
        int nMd;
        u32 version;
    } rows[] = {{0, 6}, {2, 6}, {99, 6}, {100, 8}, {101, 8}, {127, 8}};
    for (const auto &row : rows) {
        SCOPED_TRACE(row.nMd);
        const STEPS asked = {{"/sbin/mdadm -E /dev/sda3", {.szOut = Examination(row.nMd)}}};
        const MACHINE machine = MachineOfDisks({{"sda", PLACES_6}});
        ExpectVersion({"first", machine, FIRST, row.version, asked}, PartitionLayoutGet);
        ExpectVersion({"biggest", machine, BIGGEST, row.version,
                       asked + (row.version == 6 ? Biggest(6) : STEPS{})},
                      BiggestGet);
    }
}

// Asks for the first known one alone.
u32 VersionFirst()
{
    u32 version = 0;
    EXPECT_EQ(PartitionLayoutGet(&version), 0);
    return version;
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
TEST(PartitionVersionArray, IsThatOfTheMemberThatTheFolderHasFirst)
{
    constexpr char FOLDER[] = "/sys/block/md0/md";
    MACHINE machine = MachineOfDisks({{"sda", PLACES_6}, {"sdb", PLACES_7}});
    MachineFolder(machine, FOLDER);
    const std::vector<std::string> orders[] = {{"dev-sda1", "dev-sdb1"}, {"dev-sdb1", "dev-sda1"}};
    std::string szFirsts;
    for (const std::vector<std::string> &order : orders) {
        const RUN_RESULT result = MachineCall(machine, [&order, &FOLDER] {
            for (const std::string &szName : order) {
                std::filesystem::create_directory(FOLDER + ("/" + szName));
            }
            const std::string szFirst = FirstMember(FOLDER);
            EXPECT_EQ(VersionFirst(), szFirst == "dev-sda1" ? 6U : 7U);
            printf("%s ", szFirst.c_str());
        });
        szFirsts += result.szOut;
    }
    EXPECT_NE(szFirsts.find("dev-sdb1"), std::string::npos) << szFirsts;
}

// One known member among blank ones, whichever comes first.
TEST(PartitionVersionArray, IsThatOfTheFirstKnownMember)
{
    MachineCall(MachineOfArray({{"sda", BLANK}, {"sdb", PLACES_6}, {"sdc", BLANK}},
                               {{"sda1"}, {"sdb1"}, {"sdc1"}}),
                [] {
                    u32 version = 0;
                    EXPECT_EQ(PartitionLayoutGetMax(&version, 1), 0);
                    EXPECT_EQ(version, 6U);
                });
}

// Before the disks are looked for: the code that stands in the end is that of a port's key.
TEST(PartitionVersionDisks, AreLookedForBehindRaid)
{
    // Such a value is no yes, and too long to be looked at.
    MACHINE machine = MachineWithConf("supportraid=perhaps\nsupport_dual_head=no\n"
                                      "support_buildin_storage=no\nusbportcfg=0x30\n"
                                      "internalportcfg=0xf\n");
    MachineDiskAdd(machine, "sda");
    MachineCall(machine, [] {
        EXPECT_EQ(VersionFirst(), 8U);
        EXPECT_EQ(NLIBCErrGet(), ERR_KEY_NOT_FOUND);
        EXPECT_QUIET(IsSupportRaid(), 0); // it was asked above
    });
    MachineCall(machine, [] {
        EXPECT_EQ(IsSupportRaid(), 0);
        EXPECT_EQ(NLIBCErrGet(), ERR_BUF_TOO_SMALL);
    });
}

// Whichever call it is that asks for the list's memory.
TEST(PartitionVersionDisks, FailWithoutMemoryForTheList)
{
    bool fSeen = false;
    for (const char *const szFunction : {"malloc", "calloc"}) {
        for (int nCall = 1; nCall <= 12 && !fSeen; nCall++) {
            const MACHINE machine = WithFault(MachineOfDisks({{"sda", BLANK}}, CONF_NO_RAID),
                                              {.szFunction = szFunction, .nCall = nCall});
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

} // namespace
