// SPDX-License-Identifier: MIT
//
// What becomes of a disk, from commands alone.
#include "scene.h"

#include <gtest/gtest.h>

namespace
{

const WORDS SYSTEM_ANEW = {"/sbin/sfdisk --fast-delete 1:2 /dev/sda", "/sbin/sfdisk -M1 /dev/sda",
                           "/sbin/sfdisk -N1 -uS -q -f -j2048 -z4980480 -tfd -F /dev/sda",
                           "/sbin/sfdisk -N2 -uS -q -f -j0 -z4194304 -tfd -F /dev/sda"};
const WORDS ALL_ANEW = {"/sbin/sfdisk --fast-delete -1 /dev/sda", "/sbin/sfdisk -M1 /dev/sda",
                        "/sbin/sfdisk -N1 -uS -q -f -j2048 -z4980480 -tfd -F /dev/sda",
                        "/sbin/sfdisk -N2 -uS -q -f -j0 -z4194304 -tfd -F /dev/sda"};
const WORDS DATA_ANEW = {"/sbin/sfdisk --fast-delete 3:128 /dev/sda", "/sbin/sfdisk -M1 /dev/sda",
                         "/sbin/sfdisk -N3  -uS -q -f -j260352 -z-1 -tfd -F /dev/sda"};

std::string PiecesText(const DISK_OUTCOME &disk)
{
    std::string text;
    for (const PIECE &piece : disk.after) {
        text += std::to_string(piece.number) + " " + std::to_string(piece.start) + " " +
                std::to_string(piece.nSector) + (piece.fKept ? " kept\n" : " new\n");
    }
    return text;
}

OUTCOME Expect(const INVENTORY &inventory, const WORDS &lines, const char *szFate,
               const char *szPieces)
{
    OUTCOME outcome = OutcomeOf(inventory, RunOf(lines));
    EXPECT_STREQ(FateText(outcome.disks[0].fate), szFate);
    EXPECT_EQ(PiecesText(outcome.disks[0]), szPieces);
    return outcome;
}

INVENTORY WithDisk(const DISK &disk)
{
    INVENTORY inventory;
    inventory.disks = {disk};
    return inventory;
}

TEST(Outcome, NoCommandLeavesAlone)
{
    Expect(WithDisk(DataDisk("sda")), {}, "left alone",
           "1 2048 4980480 kept\n2 4982528 4194304 kept\n3 9437184 1000000 kept\n");
}

TEST(Outcome, AnotherDiskIsNotThisOne)
{
    Expect(WithDisk(DataDisk("sda")), {"/sbin/sfdisk --fast-delete -1 /dev/sdaa"}, "left alone",
           "1 2048 4980480 kept\n2 4982528 4194304 kept\n3 9437184 1000000 kept\n");
}

TEST(Outcome, QuestionsLeaveAlone)
{
    RUN run;
    run.commands = {CommandOf("/sbin/sfdisk -l -uS -N1 /dev/sda", true)};
    const INVENTORY inventory = WithDisk(DataDisk("sda"));
    const OUTCOME outcome = OutcomeOf(inventory, run);
    EXPECT_EQ(outcome.disks[0].fate, FATE::ALONE);
    EXPECT_TRUE(outcome.disks[0].fAsked);
}

TEST(Outcome, SystemIsRenewed)
{
    const INVENTORY inventory = WithDisk(DataDisk("sda"));
    const OUTCOME outcome =
        Expect(inventory, SYSTEM_ANEW, "system renewed, data kept",
               "1 2048 4980480 new\n2 4982528 4194304 new\n3 9437184 1000000 kept\n");
    EXPECT_EQ(outcome.taken, (WORDS{"/dev/sda1", "/dev/sda2"}));
    EXPECT_FALSE(outcome.disks[0].fSigned);
}

TEST(Outcome, AllIsWiped)
{
    const INVENTORY inventory = WithDisk(DataDisk("sda"));
    const OUTCOME outcome =
        Expect(inventory, ALL_ANEW, "WIPED", "1 2048 4980480 new\n2 4982528 4194304 new\n");
    EXPECT_EQ(outcome.taken, (WORDS{"/dev/sda1", "/dev/sda2", "/dev/sda3", "/dev/sda"}));
    EXPECT_TRUE(outcome.disks[0].fSigned);
}

TEST(Outcome, DataIsWiped)
{
    const INVENTORY inventory = WithDisk(DataDisk("sda"));
    const OUTCOME outcome =
        Expect(inventory, DATA_ANEW, "DATA WIPED, system kept",
               "1 2048 4980480 kept\n2 4982528 4194304 kept\n3 9437184 10562816 new\n");
    EXPECT_EQ(outcome.taken, (WORDS{"/dev/sda3"}));
}

TEST(Outcome, BlankGetsPartitions)
{
    Expect(WithDisk(BlankDisk("sda")), ALL_ANEW, "blank, gets partitions",
           "1 2048 4980480 new\n2 4982528 4194304 new\n");
}

TEST(Outcome, ForeignDiskWithoutPartitionsIsWiped)
{
    DISK disk = BlankDisk("sda");
    disk.device.signatures = {{.szType = "ext4", .szLabel = "films", .fTable = false}};
    const INVENTORY inventory = WithDisk(disk);
    const OUTCOME outcome =
        Expect(inventory, ALL_ANEW, "WIPED", "1 2048 4980480 new\n2 4982528 4194304 new\n");
    ASSERT_EQ(outcome.losses.size(), 1U);
    EXPECT_EQ(outcome.losses[0].szText, "ext4 \"films\" on /dev/sda, 9.5 GiB");
}

TEST(Outcome, TooSmallForSwap)
{
    DISK disk = BlankDisk("sda");
    disk.device.nSector = 5000000;
    const INVENTORY inventory = WithDisk(disk);
    const OUTCOME outcome =
        Expect(inventory, ALL_ANEW, "blank, gets partitions", "1 2048 4980480 new\n");
    ASSERT_EQ(outcome.disks[0].misfits.size(), 1U);
    EXPECT_EQ(outcome.disks[0].misfits[0].number, 2);
    EXPECT_EQ(outcome.disks[0].misfits[0].start, 4982528U);
}

TEST(Outcome, TheRestOfALargeDiskEndsWhereTheTableDoes)
{
    DISK disk = DataDisk("sda");
    disk.device.nSector = 8000000000;
    Expect(WithDisk(disk), DATA_ANEW, "DATA WIPED, system kept",
           "1 2048 4980480 kept\n2 4982528 4194304 kept\n3 9437184 4285530111 new\n");
}

TEST(Outcome, AnExistingPartitionIsNotReplaced)
{
    Expect(WithDisk(DataDisk("sda")), {"/sbin/sfdisk -N3 -uS -j0 -z100 -tfd /dev/sda"},
           "partitions as they are",
           "1 2048 4980480 kept\n2 4982528 4194304 kept\n3 9437184 1000000 kept\n");
}

TEST(Outcome, ArrayIsLost)
{
    INVENTORY inventory;
    inventory.disks = {DataDisk("sda"), DataDisk("sdb")};
    inventory.arrays = {DataArray({"sda3", "sdb3"})};
    const OUTCOME outcome = OutcomeOf(
        inventory, RunOf({"/sbin/mdadm -S /dev/md2", "/sbin/mdadm --zero-superblock /dev/sda3",
                          "/sbin/mdadm --zero-superblock /dev/sdb3"}));
    EXPECT_EQ(outcome.stopped, (WORDS{"/dev/md2"}));
    ASSERT_EQ(outcome.losses.size(), 1U);
    EXPECT_EQ(outcome.losses[0].szText,
              "array /dev/md2, raid1 on sda3, sdb3: lost with 2 of 2 members");
}

TEST(Outcome, ArrayRunsOnWithoutOneMember)
{
    INVENTORY inventory;
    inventory.disks = {DataDisk("sda"), DataDisk("sdb")};
    inventory.arrays = {DataArray({"sda3", "sdb3"})};
    const OUTCOME outcome = OutcomeOf(inventory, RunOf(ALL_ANEW));
    ASSERT_EQ(outcome.losses.size(), 1U);
    EXPECT_EQ(outcome.losses[0].szText,
              "array /dev/md2, raid1 on sda3, sdb3: would run on without 1 of 2 members");
    EXPECT_FALSE(IsOneOf(outcome.taken, "/dev/md2"));
}

TEST(Outcome, GroupGoesWithAllItsVolumes)
{
    INVENTORY inventory;
    inventory.groups = {FilmsGroup({"/dev/md2", "/dev/md3"}, {"/films"})};
    const OUTCOME outcome =
        OutcomeOf(inventory, RunOf({"/sbin/lvremove -f /dev/vg1/films",
                                    "/sbin/vgremove -f /dev/vg1", "/sbin/pvremove -f /dev/md2"}));
    EXPECT_EQ(outcome.groups, (WORDS{"vg1"}));
    ASSERT_EQ(outcome.losses.size(), 2U);
    EXPECT_EQ(outcome.losses[0].szText, "group vg1 on /dev/md2, /dev/md3, volumes: films");
    EXPECT_EQ(outcome.losses[1].szText, "ext4 \"cinema\" on /dev/vg1/films, 1.0 GiB");
    EXPECT_EQ(outcome.losses[1].mounts, (WORDS{"/films"}));
}

} // namespace
