// SPDX-License-Identifier: MIT
#include "md_answer.h"
#include "md_health.h"
#include "table.h"
#include "test_files.h"

#include <array>
#include <cstdio>
#include <gtest/gtest.h>
#include <map>
#include <string>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <thread>
#include <vector>

namespace
{

template <std::size_t N>
void Put(char (&szField)[N], const std::string &text)
{
    std::snprintf(szField, N, "%s", text.c_str());
}

// An array of the given level with members that are in sync where the text has a 'U', as in the
// driver's own summary "[UU_]".
MD_ATTRIBUTES ArrayMake(const char *szLevel, const std::string &slots, const char *szLayout = "0")
{
    MD_ATTRIBUTES attributes = {};
    Put(attributes.szArrayState, "clean");
    Put(attributes.szLevel, szLevel);
    Put(attributes.szLayout, szLayout);
    Put(attributes.szRaidDisks, std::to_string(slots.size()));
    std::size_t nLost = 0;
    for (std::size_t slot = 0; slot < slots.size(); slot++) {
        attributes.fInSync[slot] = slots[slot] == 'U';
        nLost += slots[slot] == 'U' ? 0U : 1U;
    }
    const std::string level = szLevel;
    if (level != "raid0" && level != "linear") {
        Put(attributes.szDegraded, std::to_string(nLost));
        Put(attributes.szSyncAction, "idle");
        Put(attributes.szSyncCompleted, "none");
    }
    Put(attributes.szResyncStart, "none");
    return attributes;
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
        Put(attributes.szArrayState, "broken");
        EXPECT_EQ(MdHealthGet(&attributes), MD_HEALTH_CRASHED) << szLevel;
    }
}

TEST(MdHealthState, ReshapingCountsTheNewNumberOfDisks)
{
    MD_ATTRIBUTES attributes = ArrayMake("raid1", "UUU");
    Put(attributes.szRaidDisks, "3 (2)");
    Put(attributes.szDegraded, "2");
    EXPECT_EQ(MdHealthGet(&attributes), MD_HEALTH_DEGRADED);
}

TEST(MdIsRunning, KnowsTheStatesWithoutData)
{
    for (const char *szState : {"", "clear", "inactive"}) {
        MD_ATTRIBUTES attributes = {};
        Put(attributes.szArrayState, szState);
        EXPECT_FALSE(MdIsRunning(&attributes)) << szState;
    }
    for (const char *szState : {"clean", "active", "active-idle", "write-pending", "read-auto",
                                "readonly", "suspended", "broken"}) {
        MD_ATTRIBUTES attributes = {};
        Put(attributes.szArrayState, szState);
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

struct SYNC_CASE {
    const char *szName;
    const char *szAction;
    const char *szCompleted;
    const char *szStart;
    std::uint32_t activity;
    std::uint64_t done;
    std::uint64_t total;
};

constexpr SYNC_CASE SYNC_CASES[] = {
    {"IdleDoesNothing", "idle", "none", "none", 0, 0, 0},
    {"FrozenDoesNothing", "frozen", "none", "none", 0, 0, 0},
    {"NoActionDoesNothing", "", "none", "none", 0, 0, 0},
    {"ResyncIsActivity", "resync", "4096 / 130944", "none", 1, 4096, 130944},
    {"RecoverIsActivity", "recover", "4096 / 130944", "none", 1, 4096, 130944},
    {"CheckIsActivity", "check", "4096 / 130944", "none", 1, 4096, 130944},
    {"RepairIsActivity", "repair", "4096 / 130944", "none", 1, 4096, 130944},
    {"ReshapeIsActivity", "reshape", "4096 / 130944", "none", 1, 4096, 130944},
    {"DelayedWaitsWithoutNumbers", "resync", "delayed", "none", 1, 0, 0},
    {"NoneWaitsWithoutNumbers", "resync", "none", "none", 1, 0, 0},
    {"NothingWaitsWithoutNumbers", "resync", "", "none", 1, 0, 0},
    {"ARunningResyncHasDoneSomething", "resync", "0 / 130944", "none", 1, 1, 130944},
    {"MoreThan32Bits", "recover", "8589934592 / 17179869184", "none", 1, 8589934592, 17179869184},
    {"AResyncThatIsDueIsPending", "idle", "none", "0", 1, 0, 0},
};

TEST_ROWS(MdSyncStatus, SYNC_CASES)
{
    const SYNC_CASE &row = GetParam();
    MD_ATTRIBUTES attributes = ArrayMake("raid1", "UU");
    Put(attributes.szSyncAction, row.szAction);
    Put(attributes.szSyncCompleted, row.szCompleted);
    Put(attributes.szResyncStart, row.szStart);
    const MD_SYNC_STATUS status = MdSyncStatusGet(&attributes);
    EXPECT_EQ(status.activity, row.activity);
    EXPECT_EQ(status.done, row.done);
    EXPECT_EQ(status.total, row.total);
}

TEST(MdSyncStatusGet, ALevelWithoutRedundancyHasNothingPending)
{
    MD_ATTRIBUTES attributes = ArrayMake("raid0", "UU");
    Put(attributes.szResyncStart, "0");
    EXPECT_EQ(MdSyncStatusGet(&attributes).activity, 0U);
}

// A folder laid out as the driver lays it out below /sys/block/mdN/md.
struct MdFolder : testing::Test {
    // Each with its line end.
    void Write(const std::map<std::string, std::string> &files) const
    {
        for (const auto &[name, text] : files) {
            std::filesystem::create_directories((root / name).parent_path());
            std::ofstream(root / name) << text << "\n";
        }
    }
    const TEST_FOLDER folder;
    const std::filesystem::path &root = folder.root;
};

TEST_F(MdFolder, WithoutAStateThereIsNoArray)
{
    MD_ATTRIBUTES attributes;
    Write({{"level", "raid1"}});
    EXPECT_EQ(MdAttributesRead(root.c_str(), &attributes), -1);
    EXPECT_EQ(MdAttributesRead((root / "absent").c_str(), &attributes), -1);
}

TEST_F(MdFolder, ARebuildingMirror)
{
    MD_ATTRIBUTES attributes;
    Write({{"array_state", "active"},
           {"level", "raid1"},
           {"raid_disks", "2"},
           {"layout", "0"},
           {"degraded", "1"},
           {"sync_action", "recover"},
           {"sync_completed", "65536 / 130944"},
           {"resync_start", "none"},
           {"rd0/state", "in_sync"},
           {"rd1/state", "spare"}});
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
    Write({{"array_state", "clean"},
           {"level", "raid0"},
           {"raid_disks", "2"},
           {"resync_start", "none"},
           {"rd0/state", "in_sync"},
           {"rd1/state", "in_sync"}});
    ASSERT_EQ(MdAttributesRead(root.c_str(), &attributes), 0);
    EXPECT_EQ(MdHealthGet(&attributes), MD_HEALTH_NORMAL);
    Write({{"rd1/state", "faulty"}});
    ASSERT_EQ(MdAttributesRead(root.c_str(), &attributes), 0);
    EXPECT_EQ(MdHealthGet(&attributes), MD_HEALTH_CRASHED);
    EXPECT_EQ(MdSyncStatusGet(&attributes).activity, 0U);
}

TEST_F(MdFolder, MoreSlotsThanAnyFormatAllowsAreNotRead)
{
    MD_ATTRIBUTES attributes;
    Write({{"array_state", "clean"},
           {"level", "raid10"},
           {"layout", "258"},
           {"raid_disks", "99999999999999999999"}});
    ASSERT_EQ(MdAttributesRead(root.c_str(), &attributes), 0);
    EXPECT_FALSE(attributes.fInSync[0]);
    EXPECT_FALSE(attributes.fInSync[MD_MAX_SLOTS - 1]);
    EXPECT_EQ(MdHealthGet(&attributes), MD_HEALTH_CRASHED);
}

// The level is a pipe: who reads it waits until the test has changed the rest and writes it.
struct MdFolderThatChanges : MdFolder {
    void SetUp() override
    {
        Write({{"array_state", "clean"},
               {"raid_disks", "2"},
               {"rd0/state", "in_sync"},
               {"rd1/state", "in_sync"}});
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
    ASSERT_EQ(ReadWhile(&attributes, [this] { Write({{"array_state", "clear"}}); }), 0);
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
