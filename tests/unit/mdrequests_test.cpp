// SPDX-License-Identifier: MIT
#include "md_answer.h"
#include "md_health.h"

#include <array>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <string>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <thread>
#include <vector>

namespace
{

// An array of the given level with members that are in sync where the text has a 'U', as in the
// driver's own summary "[UU_]".
MD_ATTRIBUTES ArrayMake(const char *szLevel, const std::string &slots, const char *szLayout = "0")
{
    MD_ATTRIBUTES attributes = {};
    std::snprintf(attributes.szArrayState, sizeof(attributes.szArrayState), "clean");
    std::snprintf(attributes.szLevel, sizeof(attributes.szLevel), "%s", szLevel);
    std::snprintf(attributes.szLayout, sizeof(attributes.szLayout), "%s", szLayout);
    std::snprintf(attributes.szRaidDisks, sizeof(attributes.szRaidDisks), "%zu", slots.size());
    std::size_t nLost = 0;
    for (std::size_t slot = 0; slot < slots.size(); slot++) {
        attributes.fInSync[slot] = slots[slot] == 'U';
        nLost += slots[slot] == 'U' ? 0U : 1U;
    }
    const std::string level = szLevel;
    if (level != "raid0" && level != "linear") {
        std::snprintf(attributes.szDegraded, sizeof(attributes.szDegraded), "%zu", nLost);
        std::snprintf(attributes.szSyncAction, sizeof(attributes.szSyncAction), "idle");
        std::snprintf(attributes.szSyncCompleted, sizeof(attributes.szSyncCompleted), "none");
    }
    std::snprintf(attributes.szResyncStart, sizeof(attributes.szResyncStart), "none");
    return attributes;
}

MD_SYNC_STATUS SyncOf(const char *szAction, const char *szCompleted, const char *szStart = "none")
{
    MD_ATTRIBUTES attributes = ArrayMake("raid1", "UU");
    std::snprintf(attributes.szSyncAction, sizeof(attributes.szSyncAction), "%s", szAction);
    std::snprintf(attributes.szSyncCompleted, sizeof(attributes.szSyncCompleted), "%s",
                  szCompleted);
    std::snprintf(attributes.szResyncStart, sizeof(attributes.szResyncStart), "%s", szStart);
    return MdSyncStatusGet(&attributes);
}

struct HEALTH_CASE {
    const char *szLevel;
    const char *szSlots;
    const char *szLayout;
    std::int32_t health;
};

class MdHealth : public testing::TestWithParam<HEALTH_CASE>
{
};

TEST_P(MdHealth, FollowsFromWhatTheLevelBears)
{
    const HEALTH_CASE &row = GetParam();
    const MD_ATTRIBUTES attributes = ArrayMake(row.szLevel, row.szSlots, row.szLayout);
    EXPECT_EQ(MdHealthGet(&attributes), row.health)
        << row.szLevel << " [" << row.szSlots << "] layout " << row.szLayout;
}

// RAID10 layouts: 0x102 two near copies, 0x201 two far, 0x103 three near, 0x202 two near and two
// far, 0x10201 two at an offset.
constexpr HEALTH_CASE HEALTH_CASES[] = {
    {"linear", "UU", "0", 0},       {"linear", "U_", "0", 2},       {"raid0", "UU", "0", 0},
    {"raid0", "_U", "0", 2},        {"raid1", "UU", "0", 0},        {"raid1", "U_", "0", 1},
    {"raid1", "U___", "0", 1},      {"raid1", "____", "0", 2},      {"multipath", "U_", "0", 1},
    {"multipath", "__", "0", 2},    {"raid4", "UUU", "0", 0},       {"raid4", "UU_", "0", 1},
    {"raid4", "U__", "0", 2},       {"raid5", "UUU", "2", 0},       {"raid5", "_UU", "2", 1},
    {"raid5", "__U", "2", 2},       {"raid6", "UUUU", "2", 0},      {"raid6", "_UUU", "2", 1},
    {"raid6", "__UU", "2", 1},      {"raid6", "___U", "2", 2},      {"raid10", "UUUU", "258", 0},
    {"raid10", "_UUU", "258", 1},   {"raid10", "_U_U", "258", 1},   {"raid10", "U__U", "258", 1},
    {"raid10", "__UU", "258", 2},   {"raid10", "UU__", "258", 2},   {"raid10", "____", "258", 2},
    {"raid10", "_UU", "258", 1},    {"raid10", "U__", "258", 2},    {"raid10", "__U", "258", 2},
    {"raid10", "_U_U", "513", 1},   {"raid10", "U__U", "513", 2},   {"raid10", "_UU_", "513", 2},
    {"raid10", "__UUUU", "259", 1}, {"raid10", "___UUU", "259", 2}, {"raid10", "U____U", "259", 1},
    {"raid10", "___U", "514", 1},   {"raid10", "____", "514", 2},   {"raid10", "_U_U", "66049", 1},
    {"raid10", "__UU", "66049", 2}, {"raid77", "UU", "0", 0},       {"raid77", "U_", "0", 2},
};

INSTANTIATE_TEST_SUITE_P(Levels, MdHealth, testing::ValuesIn(HEALTH_CASES));

TEST(MdHealthState, AnArrayMarkedBrokenIsCrashedWhateverItsMembersSay)
{
    for (const char *szLevel : {"raid0", "linear", "raid1", "raid5", "raid6", "raid10"}) {
        MD_ATTRIBUTES attributes = ArrayMake(szLevel, "UUUU", "258");
        std::snprintf(attributes.szArrayState, sizeof(attributes.szArrayState), "broken");
        EXPECT_EQ(MdHealthGet(&attributes), MD_HEALTH_CRASHED) << szLevel;
    }
}

TEST(MdHealthState, ReshapingCountsTheNewNumberOfDisks)
{
    MD_ATTRIBUTES attributes = ArrayMake("raid1", "UUU");
    std::snprintf(attributes.szRaidDisks, sizeof(attributes.szRaidDisks), "3 (2)");
    std::snprintf(attributes.szDegraded, sizeof(attributes.szDegraded), "2");
    EXPECT_EQ(MdHealthGet(&attributes), MD_HEALTH_DEGRADED);
}

TEST(MdIsRunning, KnowsTheStatesWithoutData)
{
    for (const char *szState : {"", "clear", "inactive"}) {
        MD_ATTRIBUTES attributes = {};
        std::snprintf(attributes.szArrayState, sizeof(attributes.szArrayState), "%s", szState);
        EXPECT_FALSE(MdIsRunning(&attributes)) << szState;
    }
    for (const char *szState : {"clean", "active", "active-idle", "write-pending", "read-auto",
                                "readonly", "suspended", "broken"}) {
        MD_ATTRIBUTES attributes = {};
        std::snprintf(attributes.szArrayState, sizeof(attributes.szArrayState), "%s", szState);
        EXPECT_TRUE(MdIsRunning(&attributes)) << szState;
    }
}

TEST(MdMemberIsInSync, ReadsWholeWords)
{
    EXPECT_TRUE(MdMemberIsInSync("in_sync"));
    EXPECT_TRUE(MdMemberIsInSync("in_sync\n"));
    EXPECT_TRUE(MdMemberIsInSync("write_mostly,in_sync"));
    EXPECT_TRUE(MdMemberIsInSync("in_sync,write_error\n"));
    EXPECT_FALSE(MdMemberIsInSync(""));
    EXPECT_FALSE(MdMemberIsInSync("spare"));
    EXPECT_FALSE(MdMemberIsInSync("faulty"));
    EXPECT_FALSE(MdMemberIsInSync("faulty,in_sync"));
    EXPECT_FALSE(MdMemberIsInSync("not_in_sync"));
}

TEST(MdSyncStatusGet, NothingRuns)
{
    for (const char *szAction : {"idle", "frozen", ""}) {
        const MD_SYNC_STATUS status = SyncOf(szAction, "none");
        EXPECT_EQ(status.activity, 0U) << szAction;
        EXPECT_EQ(status.done, 0U) << szAction;
        EXPECT_EQ(status.total, 0U) << szAction;
    }
}

TEST(MdSyncStatusGet, EveryActionCountsAsActivity)
{
    for (const char *szAction : {"resync", "recover", "check", "repair", "reshape"}) {
        const MD_SYNC_STATUS status = SyncOf(szAction, "4096 / 130944");
        EXPECT_EQ(status.activity, 1U) << szAction;
        EXPECT_EQ(status.done, 4096U) << szAction;
        EXPECT_EQ(status.total, 130944U) << szAction;
    }
}

TEST(MdSyncStatusGet, WaitsWithoutNumbers)
{
    for (const char *szCompleted : {"delayed", "none", ""}) {
        const MD_SYNC_STATUS status = SyncOf("resync", szCompleted);
        EXPECT_EQ(status.activity, 1U) << szCompleted;
        EXPECT_EQ(status.done, 0U) << szCompleted;
    }
}

TEST(MdSyncStatusGet, ARunningResyncHasDoneSomething)
{
    const MD_SYNC_STATUS status = SyncOf("resync", "0 / 130944");
    EXPECT_EQ(status.activity, 1U);
    EXPECT_EQ(status.done, 1U);
    EXPECT_EQ(status.total, 130944U);
}

TEST(MdSyncStatusGet, HoldsMoreThan32Bits)
{
    const MD_SYNC_STATUS status = SyncOf("recover", "8589934592 / 17179869184");
    EXPECT_EQ(status.done, 8589934592U);
    EXPECT_EQ(status.total, 17179869184U);
}

TEST(MdSyncStatusGet, AResyncThatIsDueIsPending)
{
    const MD_SYNC_STATUS status = SyncOf("idle", "none", "0");
    EXPECT_EQ(status.activity, 1U);
    EXPECT_EQ(status.done, 0U);
}

TEST(MdSyncStatusGet, ALevelWithoutRedundancyHasNothingPending)
{
    MD_ATTRIBUTES attributes = ArrayMake("raid0", "UU");
    std::snprintf(attributes.szResyncStart, sizeof(attributes.szResyncStart), "0");
    EXPECT_EQ(MdSyncStatusGet(&attributes).activity, 0U);
}

// A folder laid out as the driver lays it out below /sys/block/mdN/md.
struct MdFolder : testing::Test {
    void SetUp() override
    {
        char szTemplate[] = "/tmp/mdrequests.XXXXXX";
        ASSERT_NE(mkdtemp(szTemplate), nullptr);
        root = szTemplate;
    }
    void TearDown() override
    {
        std::filesystem::remove_all(root);
    }
    void Write(const std::string &name, const std::string &text) const
    {
        std::filesystem::create_directories((root / name).parent_path());
        std::ofstream(root / name) << text;
    }
    std::filesystem::path root;
};

TEST_F(MdFolder, WithoutAStateThereIsNoArray)
{
    MD_ATTRIBUTES attributes;
    Write("level", "raid1\n");
    EXPECT_EQ(MdAttributesRead(root.c_str(), &attributes), -1);
    EXPECT_EQ(MdAttributesRead((root / "absent").c_str(), &attributes), -1);
}

TEST_F(MdFolder, ARebuildingMirror)
{
    MD_ATTRIBUTES attributes;
    Write("array_state", "active\n");
    Write("level", "raid1\n");
    Write("raid_disks", "2\n");
    Write("layout", "0\n");
    Write("degraded", "1\n");
    Write("sync_action", "recover\n");
    Write("sync_completed", "65536 / 130944\n");
    Write("resync_start", "none\n");
    Write("rd0/state", "in_sync\n");
    Write("rd1/state", "spare\n");
    ASSERT_EQ(MdAttributesRead(root.c_str(), &attributes), 0);
    EXPECT_TRUE(MdIsRunning(&attributes));
    EXPECT_TRUE(attributes.fInSync[0]);
    EXPECT_FALSE(attributes.fInSync[1]);
    EXPECT_EQ(MdHealthGet(&attributes), MD_HEALTH_DEGRADED);
    const MD_SYNC_STATUS status = MdSyncStatusGet(&attributes);
    EXPECT_EQ(status.activity, 1U);
    EXPECT_EQ(status.done, 65536U);
    EXPECT_EQ(status.total, 130944U);
}

TEST_F(MdFolder, AStripeHasNoRedundancyFiles)
{
    MD_ATTRIBUTES attributes;
    Write("array_state", "clean\n");
    Write("level", "raid0\n");
    Write("raid_disks", "2\n");
    Write("resync_start", "none\n");
    Write("rd0/state", "in_sync\n");
    Write("rd1/state", "in_sync\n");
    ASSERT_EQ(MdAttributesRead(root.c_str(), &attributes), 0);
    EXPECT_EQ(MdHealthGet(&attributes), MD_HEALTH_NORMAL);
    Write("rd1/state", "faulty\n");
    ASSERT_EQ(MdAttributesRead(root.c_str(), &attributes), 0);
    EXPECT_EQ(MdHealthGet(&attributes), MD_HEALTH_CRASHED);
    EXPECT_EQ(MdSyncStatusGet(&attributes).activity, 0U);
}

TEST_F(MdFolder, MoreSlotsThanAnyFormatAllowsAreNotRead)
{
    MD_ATTRIBUTES attributes;
    Write("array_state", "clean\n");
    Write("level", "raid10\n");
    Write("layout", "258\n");
    Write("raid_disks", "99999999999999999999\n");
    ASSERT_EQ(MdAttributesRead(root.c_str(), &attributes), 0);
    EXPECT_FALSE(attributes.fInSync[0]);
    EXPECT_FALSE(attributes.fInSync[MD_MAX_SLOTS - 1]);
    EXPECT_EQ(MdHealthGet(&attributes), MD_HEALTH_CRASHED);
}

// The level is a pipe: who reads it waits until the test has changed the rest and writes it.
struct MdFolderThatChanges : MdFolder {
    void SetUp() override
    {
        MdFolder::SetUp();
        Write("array_state", "clean\n");
        Write("raid_disks", "2\n");
        Write("rd0/state", "in_sync\n");
        Write("rd1/state", "in_sync\n");
        ASSERT_EQ(mkfifo((root / "level").c_str(), 0600), 0);
    }
    template <typename CHANGE>
    int ReadWhile(MD_ATTRIBUTES *pAttributes, CHANGE change) const
    {
        std::thread changer([this, change] {
            std::ofstream level(root / "level");
            change();
            level << "raid1\n";
        });
        const int result = MdAttributesRead(root.c_str(), pAttributes);
        changer.join();
        return result;
    }
};

TEST_F(MdFolderThatChanges, AnArrayThatVanishesBetweenTwoReadsDoesNotRun)
{
    MD_ATTRIBUTES attributes;
    ASSERT_EQ(ReadWhile(&attributes, [this] { std::filesystem::remove(root / "array_state"); }), 0);
    EXPECT_STREQ(attributes.szArrayState, "");
    EXPECT_FALSE(MdIsRunning(&attributes));
}

TEST_F(MdFolderThatChanges, AnArrayThatStopsBetweenTwoReadsDoesNotRun)
{
    MD_ATTRIBUTES attributes;
    ASSERT_EQ(ReadWhile(&attributes, [this] { Write("array_state", "clear\n"); }), 0);
    EXPECT_FALSE(MdIsRunning(&attributes));
}

TEST_F(MdFolderThatChanges, AnArrayThatStaysIsReadToItsEnd)
{
    MD_ATTRIBUTES attributes;
    ASSERT_EQ(ReadWhile(&attributes, [] {}), 0);
    EXPECT_TRUE(MdIsRunning(&attributes));
    EXPECT_STREQ(attributes.szLevel, "raid1");
    EXPECT_EQ(MdHealthGet(&attributes), MD_HEALTH_NORMAL);
}

TEST(MdAnswerGet, WithoutAnArrayOnlyTheMdDriversOwnDevicesAreNone)
{
    // Number 1048575 is the last one there can be. The first device of memory is none of the
    // driver's.
    MD_ANSWER answer;
    EXPECT_EQ(MdAnswerGet(makedev(9, 1048575), MD_GET_ARRAY_STATUS, &answer), -1);
    EXPECT_EQ(MdAnswerGet(makedev(1, 1048575), MD_GET_ARRAY_STATUS, &answer), 0);
}

TEST(MdAnswerGet, TheRequestsHaveTheDriversNumbers)
{
#if defined(__powerpc__)
    EXPECT_EQ(MD_GET_SYNC_STATUS, 0x40180960U);
    EXPECT_EQ(MD_GET_ARRAY_STATUS, 0x40040961U);
#else
    EXPECT_EQ(MD_GET_SYNC_STATUS, 0x80180960U);
    EXPECT_EQ(MD_GET_ARRAY_STATUS, 0x80040961U);
#endif
}

TEST_F(MdFolder, APathThatDoesNotFitIsNoArray)
{
    MD_ATTRIBUTES attributes;
    EXPECT_EQ(MdAttributesRead(std::string(300, 'x').c_str(), &attributes), -1);
}

} // namespace
