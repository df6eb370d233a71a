// SPDX-License-Identifier: MIT
#include "nurostoragecore/raid_system.h"

#include "last_error.h"
#include "nurocore/error.h"
#include "storage_machine.h"

#include <cstdio>
#include <cstdlib>
#include <gtest/gtest.h>
#include <regex>
#include <string>
#include <vector>

namespace
{

constexpr u32 UNTOUCHED = 4711;
constexpr u32 NORMAL = 1;
constexpr u32 FAILED = 2;
constexpr u32 CRASHING = 4;
constexpr u32 REBUILDING = 8;
constexpr u32 SPARE = 16;
constexpr u32 NONE = 32;

struct MEMBER {
    const char *szPath;
    u32 state;
};

// A record as the query makes it, to be freed as such.
RAID_INFO *InfoMake(const std::vector<MEMBER> &members)
{
    RAID_INFO *const pInfo = static_cast<RAID_INFO *>(calloc(1, sizeof(RAID_INFO)));
    for (const MEMBER &member : members) {
        RAID_DISK *const pDisk = static_cast<RAID_DISK *>(calloc(1, sizeof(RAID_DISK)));
        (void)snprintf(pDisk->szPath, sizeof(pDisk->szPath), "%s", member.szPath);
        pDisk->state = member.state;
        RAIDDiskListPush(&pInfo->pDisks, pDisk);
    }
    return pInfo;
}

void ExpectDetail(const std::vector<MEMBER> &root, const std::vector<MEMBER> &swap,
                  const char *szDisk, int resultExpected, u32 rootExpected, u32 swapExpected)
{
    RAID_INFO *pair[2] = {InfoMake(root), InfoMake(swap)};
    u32 rootState = UNTOUCHED;
    u32 swapState = UNTOUCHED;
    EXPECT_EQ(RAIDSystemDiskStatusDetailGet(pair, szDisk, &rootState, &swapState), resultExpected);
    EXPECT_EQ(rootState, rootExpected);
    EXPECT_EQ(swapState, swapExpected);
    RAIDInfoPairFree(pair);
}

TEST(SystemDiskDetail, TellsTheDisksStateInEachArray)
{
    QuietCall(MachineWithConf(CONF_RAID), [] {
        const std::vector<MEMBER> root = {{"/dev/sda1", NORMAL}, {"/dev/sdb1", REBUILDING}};
        const std::vector<MEMBER> swap = {{"/dev/sda2", FAILED}, {"/dev/sdc2", SPARE}};
        ExpectDetail(root, swap, "/dev/sda", 1, NORMAL, FAILED);
        ExpectDetail(root, swap, "/dev/sda3", 1, NORMAL, FAILED);
        ExpectDetail(root, swap, "/dev/sdb", 1, REBUILDING, NONE);
        ExpectDetail(root, swap, "/dev/sdc1", 1, NONE, SPARE);
        ExpectDetail(root, swap, "/dev/sdd", 0, NONE, NONE);
        ExpectDetail(root, swap, "/dev/sdaa", 0, NONE, NONE);
        ExpectDetail({}, {}, "/dev/sda", 0, NONE, NONE);
    });
}

TEST(SystemDiskDetail, RefusesNull)
{
    QuietCall(MachineWithConf(CONF_RAID), [] {
        RAID_INFO *pair[2] = {InfoMake({}), InfoMake({})};
        RAID_INFO *rootless[2] = {nullptr, pair[1]};
        RAID_INFO *swapless[2] = {pair[0], nullptr};
        u32 state = UNTOUCHED;
        struct {
            RAID_INFO **ppPair;
            const char *szDisk;
        } const cases[] = {{nullptr, "sda"}, {rootless, "sda"}, {swapless, "sda"}, {pair, nullptr}};
        for (const auto &row : cases) {
            EXPECT_FAILS(RAIDSystemDiskStatusDetailGet(row.ppPair, row.szDisk, &state, &state), -1,
                         ERR_BAD_PARAMETER);
            EXPECT_FAILS(RAIDSystemDiskStatusGet(row.ppPair, row.szDisk, &state), -1,
                         ERR_BAD_PARAMETER);
        }
        EXPECT_FAILS(RAIDSystemDiskStatusDetailGet(pair, "sda", nullptr, &state), -1,
                     ERR_BAD_PARAMETER);
        EXPECT_FAILS(RAIDSystemDiskStatusDetailGet(pair, "sda", &state, nullptr), -1,
                     ERR_BAD_PARAMETER);
        EXPECT_EQ(state, UNTOUCHED);
        RAIDInfoPairFree(pair);
    });
}

// The longest path that is searched, and the first that is too long.
TEST(SystemDiskDetail, SearchesPathsOfUpTo127Characters)
{
    MachineCall(MachineWithConf(CONF_RAID), [] {
        const std::string szDisk(127, 'x');
        ExpectDetail({}, {}, szDisk.c_str(), 0, NONE, NONE);
        RAID_INFO *pair[2] = {InfoMake({}), InfoMake({})};
        u32 state = UNTOUCHED;
        EXPECT_EQ(RAIDSystemDiskStatusDetailGet(pair, (szDisk + "x").c_str(), &state, &state), -1);
        RAIDInfoPairFree(pair);
    });
}

// A name that is too long for a disk cannot be searched. The code is that of the search.
TEST(SystemDiskDetail, FailsWhenTheDiskCannotBeSearched)
{
    const RUN_RESULT result = MachineCall(MachineWithConf(CONF_RAID), [] {
        RAID_INFO *pair[2] = {InfoMake({{"/dev/sda1", NORMAL}}), InfoMake({})};
        const std::string szDisk = "/dev/" + std::string(128, 'x');
        u32 status = UNTOUCHED;
        RecordReset();
        EXPECT_EQ(RAIDSystemDiskStatusGet(pair, szDisk.c_str(), &status), -1);
        EXPECT_EQ(status, UNTOUCHED);
        EXPECT_EQ(NLIBCErrGet(), ERR_BAD_PARAMETER);
        RAIDInfoPairFree(pair);
    });
    EXPECT_EQ(LogErrors(result),
              "<11>disk_name.cpp:# buffer size of szDiskPath should be longer than string length "
              "of szPartPath\n"
              "<11>raid_system.cpp:# Fail to check root RAID\n"
              "<11>raid_system.cpp:# Fail to get system disk detail status\n");
}

// ---- what follows for the disk -----------------------------------------------------------------

struct STATUS_CASE {
    u32 root; // NONE: no member
    u32 swap;
    int result;
    u32 status;
    u32 statusWithoutSwap; // where the model's swap is on no disk
};

constexpr STATUS_CASE STATUS_CASES[] = {
    {NORMAL, NORMAL, 1, NORMAL, NORMAL},
    {NORMAL, NONE, 1, FAILED, NORMAL},
    {NORMAL, FAILED, 1, FAILED, NORMAL},
    {NORMAL, CRASHING, 1, FAILED, NORMAL},
    {NORMAL, REBUILDING, 1, NORMAL, NORMAL},
    {NORMAL, SPARE, 1, NORMAL, NORMAL},
    {REBUILDING, NORMAL, 1, NORMAL, NORMAL},
    {SPARE, SPARE, 1, NORMAL, NORMAL},
    {NONE, NORMAL, 1, FAILED, FAILED},
    {FAILED, NORMAL, 1, FAILED, FAILED},
    {CRASHING, NORMAL, 1, FAILED, FAILED},
    {FAILED, FAILED, 1, FAILED, FAILED},
    {NONE, NONE, 0, NONE, NONE},
};

std::vector<MEMBER> Members(const char *szPath, u32 state)
{
    return state == NONE ? std::vector<MEMBER>{} : std::vector<MEMBER>{{szPath, state}};
}

void ExpectStatus(const STATUS_CASE &row, u32 statusExpected)
{
    RAID_INFO *pair[2] = {InfoMake(Members("/dev/sda1", row.root)),
                          InfoMake(Members("/dev/sda2", row.swap))};
    u32 status = UNTOUCHED;
    EXPECT_EQ(RAIDSystemDiskStatusGet(pair, "/dev/sda", &status), row.result);
    EXPECT_EQ(status, statusExpected);
    EXPECT_EQ(RAIDSystemDiskStatusGet(pair, "/dev/sda", nullptr), row.result);
    RAIDInfoPairFree(pair);
}

// From the root array's alone where swap is on no disk.
TEST(SystemDiskStatus, FollowsFromBothStates)
{
    const struct {
        const char *szConf;
        bool fSwap;
    } models[] = {{"", true},
                  {"no_disk_swap=no\n", true},
                  {"no_disk_swap=\n", true},
                  {"no_disk_swap=yes\n", false},
                  {"no_disk_swap=\"YES\"\n", false}};
    for (const auto &model : models) {
        SCOPED_TRACE(model.szConf);
        QuietCall(MachineWithConf(model.szConf), [&model] {
            for (const STATUS_CASE &row : STATUS_CASES) {
                SCOPED_TRACE(testing::Message() << row.root << ' ' << row.swap);
                ExpectStatus(row, model.fSwap ? row.status : row.statusWithoutSwap);
            }
        });
    }
}

TEST(SystemDiskStatus, TakesAModelWithoutFileForOneWithSwap)
{
    const auto ask = [] { ExpectStatus({NORMAL, NONE, 1, FAILED, FAILED}, FAILED); };
    const RUN_RESULT result = MachineCall(MachineMake(), ask);
    for (const LOG_LINE &line : result.log) {
        EXPECT_EQ(line.priority, 15);
        EXPECT_TRUE(std::regex_match(
            line.szText,
            std::regex(R"(keyvalue\.cpp:# NLIBCFileGetKeyValue\(no_disk_swap\) failed )"
                       R"(\[0x0900 keyvalue\.cpp:[0-9]+\])")))
            << line.szText;
    }
    EXPECT_EQ(result.log.size(), 2U); // it is asked each time
}

// Of a disk in one of the arrays, though its root state decides alone; not of any other disk.
TEST(SystemDiskStatus, AsksForTheSwapOfEveryMember)
{
    for (const u32 root : {NONE, FAILED, CRASHING, NORMAL}) {
        QuietCall(MachineWithConf("maxdisks=4\n"), [root] {
            RAID_INFO *pair[2] = {InfoMake(Members("/dev/sda1", root)),
                                  InfoMake({{"/dev/sda2", NORMAL}})};
            RecordReset();
            EXPECT_EQ(RAIDSystemDiskStatusGet(pair, "/dev/sda", nullptr), 1);
            EXPECT_EQ(NLIBCErrGet(), ERR_KEY_NOT_FOUND) << root;
            RecordReset();
            EXPECT_EQ(RAIDSystemDiskStatusGet(pair, "/dev/sdb", nullptr), 0);
            EXPECT_EQ(NLIBCErrGet(), OLD_CODE) << root;
            RAIDInfoPairFree(pair);
        });
    }
}

TEST(SystemPair, IsFreedAndForgotten)
{
    MachineCall(MachineMake(), [] {
        RAID_INFO *pair[2] = {InfoMake({{"/dev/sda1", NORMAL}, {"/dev/sdb1", NORMAL}}), nullptr};
        RAIDInfoPairFree(pair);
        EXPECT_EQ(pair[0], nullptr);
        EXPECT_EQ(pair[1], nullptr);
        RAIDInfoPairFree(pair);
        RAIDInfoPairFree(nullptr);
    });
}

} // namespace
