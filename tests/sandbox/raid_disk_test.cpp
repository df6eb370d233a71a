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

struct MEMBER_CASE {
    std::string szState;
    std::string szSlot;
    u32 state;
    i32 slot;
};

// The records of member sda3 with these files.
void ExpectMembers(const std::vector<MEMBER_CASE> &rows)
{
    for (const MEMBER_CASE &row : rows) {
        SCOPED_TRACE("state \"" + row.szState + "\", slot \"" + row.szSlot + "\"");
        QuietCall(MembersMake({{"sda3", row.szState, row.szSlot}}), [&] {
            RAID_DISK *pDisk = nullptr;
            EXPECT_QUIET(RAIDDiskCreate(MEMBER, &pDisk), 0);
            ASSERT_NE(pDisk, nullptr);
            EXPECT_EQ(pDisk->state, row.state);
            EXPECT_EQ(pDisk->slot, row.slot);
            EXPECT_EQ(pDisk->pNext, nullptr);
            EXPECT_STREQ(pDisk->szPath, "/dev/sda3");
            RAIDDiskListFree(pDisk);
        });
    }
}

std::string NamesOf(const RAID_DISK *pDisks)
{
    std::string szNames;
    for (const RAID_DISK *p = pDisks; p != nullptr; p = p->pNext) {
        szNames += std::string(p->szPath) + " ";
    }
    return szNames;
}

// ---- one member --------------------------------------------------------------------------------

TEST(RaidDisk, TheOrderOfTheWordsDecidesTheState)
{
    ExpectMembers({
        {"in_sync\n", "0\n", 1, 0},
        {"in_sync,write_mostly\n", "0\n", 1, 0},
        {"in_sync", "0\n", 1, 0},
        {"\n", "0\n", 1, 0},
        {"journal\n", "none\n", 1, -1},
        {"blocked\n", "0\n", 1, 0},
        {"FAULTY\n", "0\n", 1, 0},
        {"faulty\n", "0\n", 2, 0},
        {"faulty\n", "none\n", 2, -1}, // its slot is read too
        {"faulty,in_sync\n", "0\n", 2, 0},
        {"in_sync,faulty\n", "0\n", 2, 0},
        {"spare,faulty\n", "none\n", 2, -1},
        {"faulty,write_error\n", "0\n", 2, 0},
        {"error,faulty\n", "0\n", 2, 0},
        {"notfaultyatall\n", "0\n", 2, 0},
        {"error\n", "0\n", 4, 0},
        {"in_sync,error\n", "0\n", 4, 0},
        {"spare,want_error\n", "none\n", 4, -1},
        {"write_error,in_sync\n", "0\n", 1, 0},
        {"in_sync,write_error\n", "0\n", 1, 0},
        {"write_error\n", "0\n", 1, 0},
        {"write_error,error\n", "0\n", 1, 0},
        {"write_error,spare\n", "none\n", 16, -1},
        {"in_sync,spare\n", "none\n", 1, -1},
        {"spare\n", "1\n", 8, 1},
        {"spare\n", "none\n", 16, -1},
        {"spare,blocked\n", "nonesuch\n", 16, 0},
        {"spare\n", "0\n", 8, 0},
        {"xsparex\n", "3\n", 8, 3},
    });
}

TEST(RaidDisk, TheStateIsReadUpTo31Characters)
{
    const std::string szFiller(26, 'x');
    ExpectMembers({
        {"x" + szFiller.substr(0, 24) + "faulty\n", "0\n", 2, 0}, // characters 26 to 31
        {szFiller + "faulty\n", "0\n", 1, 0},
        {"in_sync\nfaulty\n", "0\n", 1, 0}, // the first line alone
    });
}

TEST(RaidDisk, TheSlotIsANumberOrNone)
{
    ExpectMembers({
        {"in_sync\n", "0\n", 1, 0},
        {"in_sync\n", "1\n", 1, 1},
        {"in_sync\n", "12", 1, 12},
        {"in_sync\n", "none\n", 1, -1},
        {"in_sync\n", "none", 1, -1},
        {"in_sync\n", "-3\n", 1, -3},
        {"in_sync\n", "7 and more\n", 1, 7},
        {"in_sync\n", "abc\n", 1, 0},
        {"in_sync\n", "\n", 1, 0},
        {"in_sync\n", "nonesuch\n", 1, 0},
        {"in_sync\n", "none \n", 1, 0},
        {"in_sync\n", "2147483647\n", 1, 2147483647},
        {"in_sync\n", "2147483648\n", 1, 2147483647},
        {"in_sync\n", "-99999999999\n", 1, -2147483647 - 1},
    });
}

TEST(RaidDisk, TheSlotIsReadUpTo63Characters)
{
    const std::string szZeros(61, '0');
    ExpectMembers({
        {"in_sync\n", szZeros + "12\n", 1, 12},
        {"in_sync\n", szZeros + "123\n", 1, 12}, // its last digit is the 64th character
        {"in_sync\n", std::string(59, ' ') + "none\n", 1, 0},
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

const std::string TOLD = "<15>raid_disk.cpp:# Failed to ";
const std::string OF_DIR = " /sys/block/md2/md/dev-sda3, errno=0X";
const std::string OF_STATE = " /sys/block/md2/md/dev-sda3/state, errno=";
const std::string OF_SLOT = " /sys/block/md2/md/dev-sda3/slot, errno=";
const STEPS NO_STATE = {{TOLD + "fopen" + OF_STATE + "No such file or directory"},
                        {TOLD + "get status from" + OF_STATE + "0X900"}};

TEST(RaidDiskFailure, IsToldAndLeavesNoRecord)
{
    const FAILURE_CASE cases[] = {
        {"no memory",
         WithFault(MembersMake({{"sda3"}}), {.szFunction = "calloc"}),
         0x0200,
         {{"fault calloc 1"}, {TOLD + "calloc, errno=Cannot allocate memory"}}},
        {"no member",
         MachineMake(),
         0x9A00,
         {{TOLD + "strstr /sys/block/md2/md/rd0, errno=Success"},
          {TOLD + "get path from /sys/block/md2/md/rd0 ,errno=0X9A00"}},
         "/sys/block/md2/md/rd0"},
        {"no state", MembersMake({{"sda3", NO_FILE, "0\n"}}), 0x0900,
         NO_STATE + STEPS{{TOLD + "get status from" + OF_DIR + "900"}}},
        {"an empty state",
         MembersMake({{"sda3", "", "0\n"}}),
         0x0A00,
         {{TOLD + "NLIBCFgets" + OF_STATE + "Success"},
          {TOLD + "get status from" + OF_STATE + "0XA00"},
          {TOLD + "get status from" + OF_DIR + "A00"}}},
        {"a spare without a slot",
         MembersMake({{"sda3", "spare\n", NO_FILE}}),
         0x0900,
         {{TOLD + "fopen" + OF_SLOT + "No such file or directory"},
          {TOLD + "get status from" + OF_SLOT + "0X900"},
          {TOLD + "get status from" + OF_DIR + "900"}}},
        // The only failure that leaves the code as it was.
        {"no slot",
         MembersMake({{"sda3", "in_sync\n", NO_FILE}}),
         OLD_CODE,
         {{"<11>raid_disk.cpp:# failed to fopen" + OF_SLOT + "No such file or directory"},
          {TOLD + "get slot of" + OF_DIR + "FFFFFF00"}}},
        {"an empty slot",
         MembersMake({{"sda3", "in_sync\n", ""}}),
         0x0A00,
         {{TOLD + "get disk slot, errno=Success"}, {TOLD + "get slot of" + OF_DIR + "A00"}}}};
    for (const FAILURE_CASE &row : cases) {
        const auto call = [&row] {
            RAID_DISK *pDisk = nullptr;
            const int result = RAIDDiskCreate(row.szDir, &pDisk);
            EXPECT_EQ(pDisk, nullptr);
            return result;
        };
        (void)ExpectCall({row.szName, row.machine, call, -1, row.code, row.steps});
    }
}

TEST(RaidDiskStatus, FailsAsItsFileFails)
{
    const auto call = [] {
        u32 state = 99;
        return RAIDDiskStatusGet(MEMBER, &state);
    };
    (void)ExpectCall(
        {"no state", MembersMake({{"sda3", NO_FILE, "0\n"}}), call, -1, 0x0900, NO_STATE});
}

// ---- attributes --------------------------------------------------------------------------------

TEST(RaidDiskAttr, IsTheFirstLineUpTo31Characters)
{
    MACHINE machine = MachineMake();
    MachineFile(machine, "/sys/short", "one\ntwo\n");
    MachineFile(machine, "/sys/bare", "one");
    MachineFile(machine, "/sys/long", "0123456789012345678901234567890123456789\n");
    MachineFile(machine, "/sys/empty", "");
    const RUN_RESULT result = MachineCall(machine, [] {
        char szBuf[RAID_ATTR_SIZE] = "";
        EXPECT_QUIET(RAIDDiskAttrRead("/sys/short", szBuf), 0);
        EXPECT_STREQ(szBuf, "one\n");
        EXPECT_QUIET(RAIDDiskAttrRead("/sys/bare", szBuf), 0);
        EXPECT_STREQ(szBuf, "one");
        EXPECT_QUIET(RAIDDiskAttrRead("/sys/long", szBuf), 0);
        EXPECT_STREQ(szBuf, "0123456789012345678901234567890");
        EXPECT_FAILS(RAIDDiskAttrRead(nullptr, szBuf), -1, 0x0D00U);
        EXPECT_FAILS(RAIDDiskAttrRead("/sys/empty", nullptr), -1, 0x0D00U);
        EXPECT_FAILS(RAIDDiskAttrRead("/sys/missing", szBuf), -1, 0x0900U);
        EXPECT_FAILS(RAIDDiskAttrRead("/sys/empty", szBuf), -1, 0x0A00U);
    });
    ExpectSteps(result, {{"<15>raid_disk.cpp:# parameter error"},
                         {"<15>raid_disk.cpp:# parameter error"},
                         {TOLD + "fopen /sys/missing, errno=No such file or directory"},
                         {TOLD + "NLIBCFgets /sys/empty, errno=Success"}});
}

// ---- the list ----------------------------------------------------------------------------------

// The members of the array, and what else is done.
void ExpectList(const char *szName, const MACHINE &machine, const std::string &szMembers,
                u32 code = OLD_CODE, const STEPS &steps = {}, int result = 0,
                const char *szPath = "/dev/md2")
{
    const auto call = [&] {
        RAID_DISK *pDisks = nullptr;
        const int resultGot = RAIDDiskListGet(szPath, &pDisks);
        EXPECT_EQ(NamesOf(pDisks), szMembers);
        RAIDDiskListFree(pDisks);
        return resultGot;
    };
    (void)ExpectCall({szName, machine, call, result, code, steps});
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
        EXPECT_QUIET(RAIDDiskListGet("/dev/md2", &pDisks), 0);
        EXPECT_EQ(pDisks, &disk);
        EXPECT_QUIET(RAIDDiskListGet("/dev/md77", &pDisks), 0);
        EXPECT_EQ(pDisks, &disk);
    });
}

TEST(RaidDiskList, AMemberThatFailsIsSkipped)
{
    const std::string szCreate = TOLD + "create disk info from /sys/block/md2/md/dev-sd";
    ExpectList("an empty slot", MembersMake({{"sda3"}, {"sdb3", "in_sync\n", ""}, {"sdc3"}}),
               "/dev/sdc3 /dev/sda3 ", 0x0A00,
               {{TOLD + "get disk slot, errno=Success"},
                {TOLD + "get slot of /sys/block/md2/md/dev-sdb3, errno=0XA00"},
                {szCreate + "b3 ,errno=0XA00"}});
    ExpectList("no memory", WithFault(MembersMake({{"sda3"}, {"sdb3"}}), {.szFunction = "calloc"}),
               "/dev/sdb3 ", 0x0200,
               {{"fault calloc 1"},
                {TOLD + "calloc, errno=Cannot allocate memory"},
                {szCreate + "a3 ,errno=0X200"}});
}

TEST(RaidDiskList, AnotherPathIsRefused)
{
    for (const std::string szPath : {"/dev/sda", "/dev/md", "md2", ""}) {
        ExpectList("no array", MembersMake({{"sda3"}}), "", 0xBE00,
                   {{"<15>raid_disk.cpp:# invalide path " + szPath + ", errno=Success"}}, -1,
                   szPath.c_str());
    }
}

TEST(RaidDiskList, AFolderThatCannotBeRead)
{
    const std::string szTold =
        "<15>raid_disk.cpp:# failed to glob '/sys/block/md2/md/dev-*', errno=";
    const auto failing = [](int error) {
        return WithFault(MembersMake({{"sda3"}}), {.szFunction = "glob", .error = error});
    };
    ExpectList("an error", failing(EIO), "", 0x8000,
               {{"fault glob 1"}, {szTold + "Input/output error"}}, -1);
    ExpectList("no memory", failing(ENOMEM), "", 0x8000,
               {{"fault glob 1"}, {szTold + "Cannot allocate memory"}}, -1);
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
            EXPECT_QUIET(RAIDSyncActionGet(2, &action), one.result);
            EXPECT_EQ(action, one.action);
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

TEST(SyncAction, FailsWithoutACode)
{
    MACHINE machine = MachineMake();
    MachineMdAdd(machine, {.nMd = 2, .szSyncAction = ""});
    const RUN_RESULT result = MachineCall(machine, [] {
        int action = 99;
        EXPECT_QUIET(RAIDSyncActionGet(3, &action), -1);
        EXPECT_QUIET(RAIDSyncActionGet(2, &action), -1);
        EXPECT_EQ(action, 99);
    });
    EXPECT_EQ(LogText(result),
              "<11>raid_disk.cpp:# open \"/sys/block/md3/md/sync_action\" failed\n"
              "<11>raid_disk.cpp:# failed to get line from \"/sys/block/md2/md/sync_action\"\n");
}

} // namespace
