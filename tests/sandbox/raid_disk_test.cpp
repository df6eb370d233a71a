// SPDX-License-Identifier: MIT
#include "nurostoragecore/raid_disk.h"

#include "steps.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <cstddef>
#include <cstdlib>
#include <filesystem>
#include <fstream>

namespace
{

constexpr const char *MEMBER = "/sys/block/md2/md/dev-sda3";

// The order of the fields.
static_assert(offsetof(RAID_DISK, szPath) == 0 && sizeof(RAID_DISK::szPath) == 128);
static_assert(offsetof(RAID_DISK, state) == 128 && offsetof(RAID_DISK, slot) == 132);
static_assert(offsetof(RAID_DISK, slot) < offsetof(RAID_DISK, pNext));

MACHINE MembersMake(const std::vector<MACHINE_MEMBER> &members)
{
    MACHINE machine = MachineMake();
    MachineMdAdd(machine, {.nMd = 2, .members = members});
    return machine;
}

RAID_DISK MemberMake(const char *szPath, RAID_DISK *pNext = nullptr)
{
    RAID_DISK disk = {};
    snprintf(disk.szPath, sizeof(disk.szPath), "%s", szPath);
    disk.pNext = pNext;
    return disk;
}

// Builds the record of member sda3 and lets the body look at it.
void WithMember(const std::string &szState, const std::string &szSlot,
                const std::function<void(const RAID_DISK &)> &body)
{
    SCOPED_TRACE("state \"" + szState + "\", slot \"" + szSlot + "\"");
    QuietCall(MembersMake({{"sda3", szState, szSlot}}), [&] {
        RecordReset();
        RAID_DISK *pDisk = nullptr;
        ASSERT_EQ(RAIDDiskCreate(MEMBER, &pDisk), 0);
        ASSERT_NE(pDisk, nullptr);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
        body(*pDisk);
        RAIDDiskListFree(pDisk);
    });
}

std::string NamesOf(const RAID_DISK *pDisks)
{
    std::string szNames;
    for (const RAID_DISK *p = pDisks; p != nullptr; p = p->pNext) {
        szNames += std::string(p->szPath) + " ";
    }
    return szNames;
}

} // namespace

// ---- one member --------------------------------------------------------------------------------

struct STATE_CASE {
    const char *szState;
    const char *szSlot;
    u32 state;
};

TEST(RaidDisk, TheOrderOfTheWordsDecidesTheState)
{
    for (const STATE_CASE &one : {
             STATE_CASE{"in_sync\n", "0\n", 1},
             {"in_sync,write_mostly\n", "0\n", 1},
             {"in_sync", "0\n", 1},
             {"\n", "0\n", 1},
             {"journal\n", "none\n", 1},
             {"blocked\n", "0\n", 1},
             {"FAULTY\n", "0\n", 1},
             {"faulty\n", "0\n", 2},
             {"faulty,in_sync\n", "0\n", 2},
             {"in_sync,faulty\n", "0\n", 2},
             {"spare,faulty\n", "none\n", 2},
             {"faulty,write_error\n", "0\n", 2},
             {"error,faulty\n", "0\n", 2},
             {"notfaultyatall\n", "0\n", 2},
             {"error\n", "0\n", 4},
             {"in_sync,error\n", "0\n", 4},
             {"spare,want_error\n", "none\n", 4},
             {"write_error,in_sync\n", "0\n", 1},
             {"in_sync,write_error\n", "0\n", 1},
             {"write_error\n", "0\n", 1},
             {"write_error,error\n", "0\n", 1},
             {"write_error,spare\n", "none\n", 16},
             {"in_sync,spare\n", "none\n", 1},
             {"spare\n", "1\n", 8},
             {"spare\n", "none\n", 16},
             {"spare,blocked\n", "nonesuch\n", 16},
             {"spare\n", "0\n", 8},
             {"xsparex\n", "3\n", 8},
         }) {
        WithMember(one.szState, one.szSlot,
                   [&](const RAID_DISK &disk) { EXPECT_EQ(disk.state, one.state); });
    }
}

TEST(RaidDisk, TheStateIsReadUpTo31Characters)
{
    const std::string szFiller(26, 'x');
    WithMember("x" + szFiller.substr(0, 24) + "faulty\n", "0\n", // characters 26 to 31
               [](const RAID_DISK &disk) { EXPECT_EQ(disk.state, 2U); });
    WithMember(szFiller + "faulty\n", "0\n",
               [](const RAID_DISK &disk) { EXPECT_EQ(disk.state, 1U); });
    WithMember("in_sync\nfaulty\n", "0\n", // the first line alone
               [](const RAID_DISK &disk) { EXPECT_EQ(disk.state, 1U); });
}

struct SLOT_CASE {
    const char *szSlot;
    i32 slot;
};

TEST(RaidDisk, TheSlotIsANumberOrNone)
{
    for (const SLOT_CASE &one : {
             SLOT_CASE{"0\n", 0},
             {"1\n", 1},
             {"12", 12},
             {"none\n", -1},
             {"none", -1},
             {"-3\n", -3},
             {"7 and more\n", 7},
             {"abc\n", 0},
             {"\n", 0},
             {"nonesuch\n", 0},
             {"none \n", 0},
             {"2147483647\n", 2147483647},
             {"2147483648\n", 2147483647},
             {"-99999999999\n", -2147483647 - 1},
         }) {
        WithMember("in_sync\n", one.szSlot, [&](const RAID_DISK &disk) {
            EXPECT_EQ(disk.slot, one.slot);
            EXPECT_EQ(disk.state, 1U);
            EXPECT_EQ(disk.pNext, nullptr);
            EXPECT_STREQ(disk.szPath, "/dev/sda3");
        });
    }
}

TEST(RaidDisk, TheSlotIsReadUpTo63Characters)
{
    const std::string szZeros(61, '0');
    const struct {
        std::string szSlot;
        i32 slot;
    } slots[] = {
        {szZeros + "12\n", 12},
        {szZeros + "123\n", 12}, // its last digit is the 64th character
        {std::string(59, ' ') + "none\n", 0},
    };
    for (const auto &row : slots) {
        WithMember("in_sync\n", row.szSlot,
                   [&](const RAID_DISK &disk) { EXPECT_EQ(disk.slot, row.slot); });
    }
}

TEST(RaidDisk, AFaultyMembersSlotIsReadToo)
{
    WithMember("faulty\n", "none\n", [](const RAID_DISK &disk) {
        EXPECT_EQ(disk.state, 2U);
        EXPECT_EQ(disk.slot, -1);
    });
}

TEST(RaidDisk, TheNameIsAllBehindTheFirstDev)
{
    const struct {
        std::string szDir;
        std::string szPath;
    } names[] = {
        {"/sys/block/md2/md/dev-dev-1", "/dev/dev-1"},
        {"/sys/block/md2/md/dev-", "/dev/"},
        {"/sys/block/md2/md/dev-nvme0n1p1", "/dev/nvme0n1p1"},
        {"/sys/block/md2/md/dev-" + std::string(122, 'x'), "/dev/" + std::string(122, 'x')},
        {"/sys/block/md2/md/dev-" + std::string(123, 'x'), "/dev/" + std::string(122, 'x')},
        {"/sys/block/md2/md/dev-" + std::string(250, 'x'), "/dev/" + std::string(122, 'x')},
    };
    for (const auto &name : names) {
        MACHINE machine = MachineMake();
        MachineFile(machine, name.szDir + "/state", "in_sync\n");
        MachineFile(machine, name.szDir + "/slot", "0\n");
        MachineCall(machine, [&] {
            RAID_DISK *pDisk = nullptr;
            ASSERT_EQ(RAIDDiskCreate(name.szDir.c_str(), &pDisk), 0);
            EXPECT_EQ(pDisk->szPath, name.szPath);
            RAIDDiskListFree(pDisk);
        });
    }
}

// ---- a member that cannot be had ---------------------------------------------------------------

struct FAILURE_CASE {
    const char *szName;
    MACHINE machine;
    u32 code;
    STEPS steps;
    const char *szDir = MEMBER;
};

TEST(RaidDiskFailure, IsToldAndLeavesNoRecord)
{
    const std::string szTold = "<15>raid_disk.cpp:# Failed to ";
    const std::string szOfDir = " /sys/block/md2/md/dev-sda3, errno=0X";
    const std::string szOfState = " /sys/block/md2/md/dev-sda3/state, errno=";
    const std::string szOfSlot = " /sys/block/md2/md/dev-sda3/slot, errno=";
    const FAILURE_CASE cases[] = {
        {"no memory",
         WithFault(MembersMake({{"sda3"}}), {.szFunction = "calloc"}),
         0x0200,
         {{"fault calloc 1"}, {szTold + "calloc, errno=Cannot allocate memory"}}},
        {"no member",
         MachineMake(),
         0x9A00,
         {{szTold + "strstr /sys/block/md2/md/rd0, errno=Success"},
          {szTold + "get path from /sys/block/md2/md/rd0 ,errno=0X9A00"}},
         "/sys/block/md2/md/rd0"},
        {"no state",
         MembersMake({{"sda3", NO_FILE, "0\n"}}),
         0x0900,
         {{szTold + "fopen" + szOfState + "No such file or directory"},
          {szTold + "get status from" + szOfState + "0X900"},
          {szTold + "get status from" + szOfDir + "900"}}},
        {"an empty state",
         MembersMake({{"sda3", "", "0\n"}}),
         0x0A00,
         {{szTold + "NLIBCFgets" + szOfState + "Success"},
          {szTold + "get status from" + szOfState + "0XA00"},
          {szTold + "get status from" + szOfDir + "A00"}}},
        {"a spare without a slot",
         MembersMake({{"sda3", "spare\n", NO_FILE}}),
         0x0900,
         {{szTold + "fopen" + szOfSlot + "No such file or directory"},
          {szTold + "get status from" + szOfSlot + "0X900"},
          {szTold + "get status from" + szOfDir + "900"}}},
        // The only failure that leaves the code as it was.
        {"no slot",
         MembersMake({{"sda3", "in_sync\n", NO_FILE}}),
         OLD_CODE,
         {{"<11>raid_disk.cpp:# failed to fopen" + szOfSlot + "No such file or directory"},
          {szTold + "get slot of" + szOfDir + "FFFFFF00"}}},
        {"an empty slot",
         MembersMake({{"sda3", "in_sync\n", ""}}),
         0x0A00,
         {{szTold + "get disk slot, errno=Success"}, {szTold + "get slot of" + szOfDir + "A00"}}}};
    for (const FAILURE_CASE &row : cases) {
        const auto call = [&row] {
            RAID_DISK *pDisk = nullptr;
            const int result = RAIDDiskCreate(row.szDir, &pDisk);
            EXPECT_EQ(pDisk, nullptr);
            return result;
        };
        (void)ExpectCall({.szName = row.szName,
                          .machine = row.machine,
                          .call = call,
                          .result = -1,
                          .code = row.code,
                          .steps = row.steps});
    }
}

TEST(RaidDiskStatus, FailsAsItsFileFails)
{
    const RUN_RESULT result = MachineCall(MembersMake({{"sda3", NO_FILE, "0\n"}}), [] {
        u32 state = 99;
        EXPECT_EQ(RAIDDiskStatusGet(MEMBER, &state), -1);
        EXPECT_EQ(NLIBCErrGet(), 0x0900U);
    });
    EXPECT_EQ(LogText(result),
              "<15>raid_disk.cpp:# Failed to fopen /sys/block/md2/md/dev-sda3/state, "
              "errno=No such file or directory\n"
              "<15>raid_disk.cpp:# Failed to get status from /sys/block/md2/md/dev-sda3/state, "
              "errno=0X900\n");
}

// ---- attributes --------------------------------------------------------------------------------

TEST(RaidDiskAttr, TheFirstLineUpTo31Characters)
{
    MACHINE machine = MachineMake();
    MachineFile(machine, "/sys/short", "one\ntwo\n");
    MachineFile(machine, "/sys/bare", "one");
    MachineFile(machine, "/sys/long", "0123456789012345678901234567890123456789\n");
    QuietCall(machine, [] {
        char szBuf[RAID_ATTR_SIZE] = "";
        RecordReset();
        EXPECT_EQ(RAIDDiskAttrRead("/sys/short", szBuf), 0);
        EXPECT_STREQ(szBuf, "one\n");
        EXPECT_EQ(RAIDDiskAttrRead("/sys/bare", szBuf), 0);
        EXPECT_STREQ(szBuf, "one");
        EXPECT_EQ(RAIDDiskAttrRead("/sys/long", szBuf), 0);
        EXPECT_STREQ(szBuf, "0123456789012345678901234567890");
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
}

TEST(RaidDiskAttr, Fails)
{
    MACHINE machine = MachineMake();
    MachineFile(machine, "/sys/empty", "");
    const RUN_RESULT result = MachineCall(machine, [] {
        char szBuf[RAID_ATTR_SIZE] = "";
        EXPECT_FAILS(RAIDDiskAttrRead(nullptr, szBuf), -1, 0x0D00U);
        EXPECT_FAILS(RAIDDiskAttrRead("/sys/empty", nullptr), -1, 0x0D00U);
        EXPECT_FAILS(RAIDDiskAttrRead("/sys/missing", szBuf), -1, 0x0900U);
        EXPECT_FAILS(RAIDDiskAttrRead("/sys/empty", szBuf), -1, 0x0A00U);
    });
    EXPECT_EQ(LogText(result),
              "<15>raid_disk.cpp:# parameter error\n"
              "<15>raid_disk.cpp:# parameter error\n"
              "<15>raid_disk.cpp:# Failed to fopen /sys/missing, errno=No such file or directory\n"
              "<15>raid_disk.cpp:# Failed to NLIBCFgets /sys/empty, errno=Success\n");
}

// ---- the list ----------------------------------------------------------------------------------

// The members of md2, and how many other things are done.
void ExpectList(const char *szName, const MACHINE &machine, const std::string &szMembers,
                u32 code = OLD_CODE, const STEPS &steps = {})
{
    const auto call = [&szMembers] {
        RAID_DISK *pDisks = nullptr;
        const int result = RAIDDiskListGet("/dev/md2", &pDisks);
        EXPECT_EQ(NamesOf(pDisks), szMembers);
        RAIDDiskListFree(pDisks);
        return result;
    };
    (void)ExpectCall(
        {.szName = szName, .machine = machine, .call = call, .code = code, .steps = steps});
}

// Whichever of them was made first: that decides the order in which the folder lists them.
TEST(RaidDiskList, TheNameThatSortsLastComesFirst)
{
    for (const bool fRising : {true, false}) {
        MACHINE machine = MembersMake({});
        // The other entries of such a folder are no members, and neither are other arrays' ones.
        MachineFolder(machine, "/sys/block/md2/md/rd0");
        MachineFile(machine, "/sys/block/md2/md/device", "");
        MachineMdAdd(machine, {.nMd = 22, .members = {{"sdc3"}}});
        machine.prepare = [fRising] {
            for (int i = 0; i < 4; i++) {
                const std::string szFolder = std::string("/sys/block/md2/md/dev-sd") +
                                             static_cast<char>(fRising ? 'a' + i : 'd' - i) + "3";
                std::filesystem::create_directory(szFolder);
                std::ofstream(szFolder + "/state") << "in_sync\n";
                std::ofstream(szFolder + "/slot") << "0\n";
            }
        };
        ExpectList(fRising ? "rising" : "falling", machine,
                   "/dev/sdd3 /dev/sdc3 /dev/sdb3 /dev/sda3 ");
    }
}

TEST(RaidDiskList, WithoutMembersTheListIsLeftAlone)
{
    QuietCall(MembersMake({}), [] {
        RAID_DISK disk = MemberMake("/dev/sdz9");
        RAID_DISK *pDisks = &disk;
        RecordReset();
        EXPECT_EQ(RAIDDiskListGet("/dev/md2", &pDisks), 0);
        EXPECT_EQ(pDisks, &disk);
        EXPECT_EQ(RAIDDiskListGet("/dev/md77", &pDisks), 0);
        EXPECT_EQ(pDisks, &disk);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
}

TEST(RaidDiskList, AMemberThatFailsIsSkipped)
{
    ExpectList("an empty slot", MembersMake({{"sda3"}, {"sdb3", "in_sync\n", ""}, {"sdc3"}}),
               "/dev/sdc3 /dev/sda3 ", 0x0A00,
               {{"<15>raid_disk.cpp:# Failed to get disk slot, errno=Success"},
                {"<15>raid_disk.cpp:# Failed to get slot of /sys/block/md2/md/dev-sdb3, "
                 "errno=0XA00"},
                {"<15>raid_disk.cpp:# Failed to create disk info from "
                 "/sys/block/md2/md/dev-sdb3 ,errno=0XA00"}});
    ExpectList("no memory", WithFault(MembersMake({{"sda3"}, {"sdb3"}}), {.szFunction = "calloc"}),
               "/dev/sdb3 ", 0x0200,
               {{"fault calloc 1"},
                {"<15>raid_disk.cpp:# Failed to calloc, errno=Cannot allocate memory"},
                {"<15>raid_disk.cpp:# Failed to create disk info from "
                 "/sys/block/md2/md/dev-sda3 ,errno=0X200"}});
}

TEST(RaidDiskList, AnotherPathIsRefused)
{
    for (const char *const szPath : {"/dev/sda", "/dev/md", "md2", ""}) {
        const RUN_RESULT result = MachineCall(MembersMake({{"sda3"}}), [&] {
            RAID_DISK *pDisks = nullptr;
            RecordReset();
            EXPECT_EQ(RAIDDiskListGet(szPath, &pDisks), -1);
            EXPECT_EQ(pDisks, nullptr);
            EXPECT_EQ(NLIBCErrGet(), 0xBE00U);
        });
        EXPECT_EQ(LogText(result),
                  std::string("<15>raid_disk.cpp:# invalide path ") + szPath + ", errno=Success\n");
    }
}

TEST(RaidDiskList, AFolderThatCannotBeRead)
{
    for (const int error : {EIO, ENOMEM}) {
        MACHINE machine = MembersMake({{"sda3"}});
        machine.faults = {{.szFunction = "glob", .nCall = 1, .error = error}};
        const RUN_RESULT result = MachineCall(machine, [] {
            RAID_DISK *pDisks = nullptr;
            EXPECT_EQ(RAIDDiskListGet("/dev/md2", &pDisks), -1);
            EXPECT_EQ(pDisks, nullptr);
            EXPECT_EQ(NLIBCErrGet(), 0x8000U);
        });
        EXPECT_EQ(LogText(result),
                  std::string("<15>raid_disk.cpp:# failed to glob '/sys/block/md2/md/dev-*', "
                              "errno=") +
                      (error == EIO ? "Input/output error\n" : "Cannot allocate memory\n"));
    }
}

TEST(RaidDiskPush, PutsTheRecordInFront)
{
    MachineCall(MachineMake(), [] {
        RAID_DISK first = MemberMake("/dev/sda1");
        RAID_DISK second = MemberMake("/dev/sdb1");
        RAID_DISK *pDisks = nullptr;
        RecordReset();
        RAIDDiskListPush(&pDisks, &first);
        RAIDDiskListPush(&pDisks, &second);
        EXPECT_EQ(NamesOf(pDisks), "/dev/sdb1 /dev/sda1 ");
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
}

TEST(RaidDiskSearch, FindsTheDiskWhateverThePartition)
{
    MachineCall(MachineMake(), [] {
        RAID_DISK last = MemberMake("/dev/mmcblk0p1");
        RAID_DISK middle = MemberMake("/dev/sdb3", &last);
        RAID_DISK again = MemberMake("/dev/sdb5", &middle);
        RAID_DISK head = MemberMake("/dev/sda3", &again);
        const struct {
            const char *szName;
            const RAID_DISK *pFound;
        } searches[] = {
            {"/dev/sda", &head},       {"/dev/sda3", &head},      {"/dev/sda12", &head},
            {"/dev/sdb", &again},      {"/dev/sdb1", &again},     {"/dev/mmcblk0", &last},
            {"/dev/mmcblk0p7", &last}, {"/dev/sdc", nullptr},     {"sda", nullptr},
            {"/dev/sd", nullptr},      {"/dev/mmcblk1", nullptr}, {"", nullptr},
            {"/dev/sdaa", nullptr},
        };
        RecordReset();
        for (const auto &search : searches) {
            SCOPED_TRACE(search.szName);
            RAID_DISK *pFound = nullptr;
            EXPECT_EQ(RAIDDiskListSearch(&head, search.szName, &pFound),
                      search.pFound != nullptr ? 1 : 0);
            EXPECT_EQ(pFound, search.pFound);
            EXPECT_EQ(RAIDDiskListSearch(&head, search.szName, nullptr),
                      search.pFound != nullptr ? 1 : 0);
        }
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
}

// A name that does not fit the 64 bytes of the comparison is equal to nothing, itself included.
TEST(RaidDiskSearch, ANameThatIsTooLongIsNotEqual)
{
    const std::string szFits = "/dev/" + std::string(58, 'x');
    const std::string szLong = "/dev/" + std::string(59, 'x');
    MachineCall(MachineMake(), [&] {
        RAID_DISK fits = MemberMake(szFits.c_str());
        RAID_DISK tooLong = MemberMake(szLong.c_str(), &fits);
        EXPECT_EQ(RAIDDiskListSearch(&tooLong, szLong.c_str(), nullptr), 0);
        EXPECT_EQ(RAIDDiskListSearch(&tooLong, szFits.c_str(), nullptr), 1);
    });
}

// A line for every name that is too long, of each member that is compared.
TEST(RaidDiskSearch, BothNamesAreCutForEachMember)
{
    const std::string szLine = "<11>disk_name.cpp:# buffer size of szDiskPath should be longer "
                               "than string length of szPartPath\n";
    const std::string szLong = "/dev/" + std::string(59, 'x');
    const auto searched = [&](const char *szFirst, const char *szSecond, const char *szWanted) {
        return LogText(MachineCall(MachineMake(), [&] {
            RAID_DISK second = MemberMake(szSecond);
            RAID_DISK first = MemberMake(szFirst, &second);
            EXPECT_EQ(RAIDDiskListSearch(&first, szWanted, nullptr), 0);
        }));
    };
    EXPECT_EQ(searched("/dev/sda3", "/dev/sdb3", "/dev/sdc"), "");
    EXPECT_EQ(searched(szLong.c_str(), "/dev/sdb3", "/dev/sdc"), szLine);
    EXPECT_EQ(searched("/dev/sda3", "/dev/sdb3", szLong.c_str()), szLine + szLine);
    EXPECT_EQ(searched(szLong.c_str(), "/dev/sdb3", szLong.c_str()), szLine + szLine + szLine);
}

TEST(RaidDisk, NullIsABadParameter)
{
    IdleCall(MembersMake({{"sda3"}}), [] {
        RAID_DISK disk = MemberMake("/dev/sda3");
        RAID_DISK *pDisk = nullptr;
        u32 state = 99;
        int action = 99;
        EXPECT_FAILS(RAIDDiskCreate(nullptr, &pDisk), -1, 0x0D00);
        EXPECT_FAILS(RAIDDiskCreate(MEMBER, nullptr), -1, 0x0D00);
        EXPECT_FAILS(RAIDDiskStatusGet(nullptr, &state), -1, 0x0D00);
        EXPECT_FAILS(RAIDDiskStatusGet(MEMBER, nullptr), -1, 0x0D00);
        EXPECT_FAILS(RAIDDiskListGet(nullptr, &pDisk), -1, 0x0D00);
        EXPECT_FAILS(RAIDDiskListGet("/dev/md2", nullptr), -1, 0x0D00);
        EXPECT_FAILS(RAIDDiskListSearch(&disk, nullptr, &pDisk), -1, 0x0D00);
        EXPECT_QUIET(RAIDDiskListSearch(nullptr, "/dev/sda", &pDisk), 0); // an empty list
        EXPECT_FAILS(RAIDSyncActionGet(2, nullptr), -1, 0x0D00);
        EXPECT_QUIET(RAIDSyncActionGet(-1, &action), -1);
        EXPECT_EQ(pDisk, nullptr);
        EXPECT_EQ(state, 99U);
        EXPECT_EQ(action, 99);
        RecordReset();
        RAIDDiskListFree(nullptr);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
        RAIDDiskListPush(nullptr, &disk);
        EXPECT_EQ(NLIBCErrGet(), 0x0200U);
        EXPECT_EQ(disk.pNext, nullptr);
        pDisk = &disk;
        RecordReset();
        RAIDDiskListPush(&pDisk, nullptr);
        EXPECT_EQ(NLIBCErrGet(), 0x0200U);
        EXPECT_EQ(NamesOf(pDisk), "/dev/sda3 ");
    });
}

// ---- the sync action ---------------------------------------------------------------------------

struct ACTION_CASE {
    std::string szText;
    int result;
    int action;
};

TEST(SyncAction, TheTextIsAPrefixOfItsWord)
{
    constexpr int LEFT_ALONE = 99;
    const ACTION_CASE cases[] = {
        {"idle\n", 0, 0},
        {"frozen\n", 0, 1},
        {"reshape\n", 0, 2},
        {"resync\n", 0, 3},
        {"check\n", 0, 4},
        {"repair\n", 0, 5},
        {"recover\n", 0, 6},
        {"\n", 0, 0}, // empty text is a prefix of the first word
        {std::string("\0idle\n", 6), 0, 0},
        {"r\n", 0, 2}, // of several words the first
        {"re\n", 0, 2},
        {"res\n", 0, 2},
        {"resy\n", 0, 3},
        {"rec\n", 0, 6},
        {"rep\n", 0, 5},
        {"c\n", 0, 4},
        {"f\n", 0, 1},
        {"idle", 0, 0}, // the last character goes, whatever it is
        {"idleX", 0, 0},
        {"x", 0, 0},
        {"idle\nresync\n", 0, 0},
        {"idle \n", -1, LEFT_ALONE},
        {"idlex\n", -1, LEFT_ALONE},
        {"resyncing\n", -1, LEFT_ALONE},
        {"Idle\n", -1, LEFT_ALONE},
        {" idle\n", -1, LEFT_ALONE},
        {"none\n", -1, LEFT_ALONE},
        {std::string(200, 'r') + "\n", -1, LEFT_ALONE},
    };
    for (const ACTION_CASE &one : cases) {
        SCOPED_TRACE(one.szText);
        MACHINE machine = MachineMake();
        MachineMdAdd(machine, {.nMd = 2, .szSyncAction = one.szText});
        QuietCall(machine, [&] {
            int action = LEFT_ALONE;
            RecordReset();
            EXPECT_EQ(RAIDSyncActionGet(2, &action), one.result);
            EXPECT_EQ(action, one.action);
            EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
        });
    }
}

TEST(SyncAction, OfArrayZeroIsOneToo)
{
    MACHINE machine = MachineMake();
    MachineMdAdd(machine, {.nMd = 0, .szSyncAction = "check\n"});
    MachineCall(machine, [] {
        int action = 99;
        EXPECT_EQ(RAIDSyncActionGet(0, &action), 0);
        EXPECT_EQ(action, 4);
    });
}

TEST(SyncAction, Fails)
{
    MACHINE machine = MachineMake();
    MachineMdAdd(machine, {.nMd = 2, .szSyncAction = ""});
    const RUN_RESULT result = MachineCall(machine, [] {
        int action = 99;
        RecordReset();
        EXPECT_EQ(RAIDSyncActionGet(-1, &action), -1);
        EXPECT_EQ(RAIDSyncActionGet(3, &action), -1);
        EXPECT_EQ(RAIDSyncActionGet(2, &action), -1);
        EXPECT_EQ(action, 99);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
        EXPECT_EQ(RAIDSyncActionGet(2, nullptr), -1);
        EXPECT_EQ(NLIBCErrGet(), ERR_BAD_PARAMETER);
    });
    EXPECT_EQ(LogText(result),
              "<11>raid_disk.cpp:# open \"/sys/block/md3/md/sync_action\" failed\n"
              "<11>raid_disk.cpp:# failed to get line from \"/sys/block/md2/md/sync_action\"\n");
}
