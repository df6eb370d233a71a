// SPDX-License-Identifier: MIT
//
// Each thing that should make a person stop, on machines that exist as records alone.
#include "scene.h"

#include <gtest/gtest.h>

#include <csignal>

namespace
{

constexpr int EXITED_WITH_1 = 1 << 8;

// What is said of a machine, one line each: "KIND: TEXT".
std::string Said(const INVENTORY &inventory, const RUN &run, const WORDS &words = {"initsys"},
                 const HOST &host = {})
{
    const OPTIONS options = {.szTool = "/sbin/arrayctl",
                             .szToolPath = "/sbin/arrayctl",
                             .form = FORM::TEXT,
                             .words = words,
                             .fHelp = false};
    const OUTCOME outcome = OutcomeOf(inventory, run);
    std::string text;
    for (const WARNING &warning : WarningsFind({.options = options,
                                                .host = host,
                                                .run = run,
                                                .inventory = inventory,
                                                .outcome = outcome})) {
        text += std::string(warning.szKind) + ": " + warning.szText + '\n';
    }
    return text;
}

INVENTORY WithDisk(const DISK &disk)
{
    INVENTORY inventory;
    inventory.disks = {disk};
    return inventory;
}

const WORDS WIPE = {"/sbin/sfdisk --fast-delete -1 /dev/sda", "/sbin/sfdisk -M1 /dev/sda"};
const WORDS TAKE_DOWN = {"/sbin/mdadm -S /dev/md2", "/sbin/mdadm --zero-superblock /dev/sda3"};

TEST(Warnings, NoneOfAMachineOfItsOwn)
{
    EXPECT_EQ(Said(WithDisk(DataDisk("sda")), RunOf(WIPE)), "");
}

TEST(Warnings, InUse)
{
    DISK disk = DataDisk("sda");
    disk.partitions[0].device.holders = {"md0"};
    disk.partitions[1].device.fSwap = true;
    disk.partitions[2].device.mounts = {"/films"};
    EXPECT_EQ(Said(WithDisk(disk), RunOf(WIPE)),
              "in-use: /dev/sda1 is in use (held by md0): the programs will refuse to change it, "
              "and the real run will end otherwise than this rehearsal\n"
              "in-use: /dev/sda2 is in use (used as swap): the programs will refuse to change it, "
              "and the real run will end otherwise than this rehearsal\n"
              "in-use: /dev/sda3 is in use (mounted at /films): the programs will refuse to change "
              "it, and the real run will end otherwise than this rehearsal\n");
}

TEST(Warnings, AnArrayThatIsStoppedLetsItsMembersGo)
{
    INVENTORY inventory = WithDisk(DataDisk("sda"));
    inventory.disks[0].partitions[2].device.holders = {"md2"};
    inventory.arrays = {DataArray({"sda3"})};
    EXPECT_EQ(Said(inventory, RunOf(TAKE_DOWN), {"destroy", "2"}), "");
}

TEST(Warnings, AMountedArrayWillNotStop)
{
    INVENTORY inventory = WithDisk(DataDisk("sda"));
    inventory.arrays = {DataArray({"sda3"})};
    inventory.arrays[0].device.mounts = {"/films"};
    EXPECT_EQ(Said(inventory, RunOf(TAKE_DOWN), {"destroy", "2"}),
              "in-use: /dev/md2 is in use (mounted at /films): it will not stop, and the real run "
              "will end otherwise than this rehearsal\n"
              "mounted: array /dev/md2, raid1 on sda3: lost with 1 of 1 members is mounted at "
              "/films\n");
}

TEST(Warnings, CutOff)
{
    DISK disk = DataDisk("sda");
    disk.partitions.erase(disk.partitions.begin(), disk.partitions.begin() + 2);
    EXPECT_EQ(Said(WithDisk(disk), RunOf(WIPE)),
              "cut-off: /dev/sda has no partitions 1 and 2 and is taken for blank, but /dev/sda3 "
              "carries the superblock of an array: it looks like a run that was cut off: "
              "recovery.md, row 1; running again loses the data\n");
}

TEST(Warnings, CutOffBetweenItsPartitions)
{
    DISK half = DataDisk("sdb");
    half.partitions.erase(half.partitions.begin() + 1);
    INVENTORY inventory = WithDisk(DataDisk("sda"));
    inventory.disks.push_back(half);
    const RUN run = RunOf({"/sbin/sfdisk -l -uS -N2 /dev/sda", "/sbin/sfdisk -l -uS -N2 /dev/sdb"});
    EXPECT_EQ(Said(inventory, run, {"initsys"}),
              "cut-off: /dev/sdb has partition 1 without 2 and is left out: it looks like a run "
              "that was cut off: recovery.md, row 4\n");
    EXPECT_EQ(Said(inventory, run, {"newvol"}), "");
    // Where no layout has RAID, all disks are made anew.
    const RUN mending =
        RunOf({"/sbin/sfdisk --fast-delete 1:2 /dev/sda", "/sbin/sfdisk -M1 /dev/sda",
               "/sbin/sfdisk --fast-delete 1:2 /dev/sdb", "/sbin/sfdisk -M1 /dev/sdb"});
    EXPECT_EQ(Said(inventory, mending, {"initsys"}), "");
    inventory.disks[1].partitions.pop_back();
    EXPECT_EQ(Said(inventory, run, {"initsys-dd"}),
              "cut-off: /dev/sdb has partition 1 without 2 and is left out: it looks like a run "
              "that was cut off: recovery.md, row 6\n");
    // Somebody else's.
    inventory.disks[1].partitions[0].start += 1;
    EXPECT_EQ(Said(inventory, run, {"initsys"}), "");
}

TEST(Warnings, WrongRowAndWideGroup)
{
    INVENTORY inventory;
    inventory.rows = {"/dev/md2:two:data:", "/dev/md20:twenty:data:"};
    inventory.groups = {{.szName = "two", .devices = {"/dev/md2"}, .volumes = {}},
                        {.szName = "twenty", .devices = {"/dev/md20", "/dev/md21"}, .volumes = {}}};
    EXPECT_EQ(Said(inventory,
                   RunOf({"/sbin/vgremove -f /dev/twenty", "/sbin/pvremove -f /dev/md2"}),
                   {"destroy", "2"}),
              "wrong-row: pvs has a row that contains /dev/md2 without being it: "
              "\"/dev/md20:twenty:data:\"; the group that is removed is twenty, two\n"
              "wide-group: the group twenty lies on more than one device: /dev/md20, /dev/md21\n");
}

TEST(Warnings, UnreadReportAndLeftOut)
{
    RUN run;
    run.log = {{.priority = 11, .szText = "arrayctl: a.cpp:1 bad device order format: 'Journal'."},
               {.priority = 11, .szText = "arrayctl: b.cpp:2 Choose biggest partition layout"},
               {.priority = 11,
                .szText = "arrayctl: c.cpp:3 [Info] 2 of 26 partitions left out, no room in the "
                          "command"}};
    EXPECT_EQ(Said({}, run),
              "unread-report: the tool could not read a report of mdadm -E: arrayctl: a.cpp:1 bad "
              "device order format: 'Journal'.\n"
              "left-out: there are more disks than a command has room for: arrayctl: c.cpp:3 "
              "[Info] 2 of 26 partitions left out, no room in the command\n");
}

TEST(Warnings, FailedListing)
{
    RUN run;
    run.commands = {CommandOf("/sbin/sfdisk -l -uS -N1 /dev/sda", true, EXITED_WITH_1),
                    CommandOf("/sbin/sfdisk -l -uS -N1 /dev/sda", true, EXITED_WITH_1),
                    CommandOf("/sbin/pvs -o pv_name", true, SIGSEGV),
                    CommandOf("/sbin/mdadm -E /dev/sda1", true, EXITED_WITH_1)};
    EXPECT_EQ(Said({}, run),
              "failed-listing: a listing failed, and may be taken for an empty one: /sbin/sfdisk "
              "-l -uS -N1 /dev/sda (status 1)\n"
              "failed-listing: a listing failed, and may be taken for an empty one: /sbin/pvs -o "
              "pv_name (signal 11)\n");
}

TEST(Warnings, ForeignSignature)
{
    DISK disk = DataDisk("sda");
    disk.device.signatures = {{.szType = "gpt", .szLabel = "", .fTable = true}};
    disk.partitions[2].device.signatures = {
        {.szType = "ext4", .szLabel = "films", .fTable = false}};
    EXPECT_EQ(Said(WithDisk(disk), RunOf(WIPE)),
              "foreign-signature: /dev/sda carries a signature that is not the appliance's: gpt\n"
              "foreign-signature: /dev/sda3 carries a signature that is not the appliance's: ext4 "
              "\"films\"\n");
}

TEST(Warnings, Markers)
{
    HOST host;
    host.markers = {"/.force_clean_all_disk", "/tmp/raid.0", "/tmp/raid.1", "/tmp/raid.5"};
    EXPECT_EQ(Said({}, {}, {"newvol"}, host),
              "marker: the marker /.force_clean_all_disk is set: every disk is wiped\n"
              "marker: the marker /tmp/raid.0 is set: newvol makes a RAID 0\n"
              "marker: the marker /tmp/raid.1 is set: newvol makes a RAID 1\n"
              "marker: the marker /tmp/raid.5 is set: newvol makes a RAID 5\n");
}

TEST(Warnings, NoSlots)
{
    RUN run;
    run.log = {
        {.priority = 11, .szText = "arrayctl: a.cpp:1 Failed to NLIBCFileGetKeyValue(/x,maxdisks)"},
        {.priority = 11,
         .szText = "arrayctl: b.cpp:2 No disk to create system and swap partition, initsys "
                   "fail!"}};
    EXPECT_EQ(Said({}, run),
              "no-slots: no disk has a slot, look at maxdisks and max_sys_raid_disks: arrayctl: "
              "a.cpp:1 Failed to NLIBCFileGetKeyValue(/x,maxdisks)\n"
              "no-slots: no disk has a slot, look at maxdisks and max_sys_raid_disks: arrayctl: "
              "b.cpp:2 No disk to create system and swap partition, initsys fail!\n");
}

TEST(Warnings, BadDisk)
{
    DISK disk = BlankDisk("sda");
    disk.fReadOnly = true;
    disk.device.fReadable = false;
    disk.device.nSector = 2000;
    WORDS lines = WIPE;
    lines.emplace_back("/sbin/sfdisk -N1 -uS -q -f -j2048 -z4980480 -tfd -F /dev/sda");
    EXPECT_EQ(Said(WithDisk(disk), RunOf(lines)),
              "bad-disk: /dev/sda is read-only: the command fails at it, after others have been "
              "changed\n"
              "bad-disk: /dev/sda cannot be read: the command fails at it, after others have been "
              "changed\n"
              "bad-disk: /dev/sda is too small for partition 1, which begins at sector 2048: the "
              "command fails at it, after others have been changed\n");
}

TEST(Warnings, OddMembers)
{
    DISK disk = DataDisk("sda");
    disk.partitions[1].device.superblock.szRole = "Replacement device 0";
    disk.partitions[2].device.superblock.szRole = "Journal";
    EXPECT_EQ(Said(WithDisk(disk), {}, {"destroy", "2"}),
              "odd-member: /dev/sda2 is a member that the tool does not read: mdadm -E calls it "
              "\"Replacement device 0\"\n"
              "odd-member: /dev/sda3 is a member that the tool does not read: mdadm -E calls it "
              "\"Journal\"\n");
}

TEST(Warnings, IncompleteArrayAndSurvivor)
{
    INVENTORY inventory = WithDisk(DataDisk("sda"));
    inventory.arrays = {DataArray({"sda3", "nvme0n1p3"})};
    inventory.arrays[0].nMissing = 1;
    EXPECT_EQ(Said(inventory, RunOf(TAKE_DOWN), {"destroy", "2"}),
              "incomplete-array: the array md2 lacks 1 of its members: their superblocks stay\n"
              "survivor: the superblock on /dev/nvme0n1p3 survives: /dev/md2 is stopped, and can "
              "come back\n");
    EXPECT_EQ(Said(inventory, {}, {"destroy", "20"}), "");
    inventory.arrays[0].fRunning = false;
    EXPECT_EQ(Said(inventory, {}, {"destroy", "2"}),
              "incomplete-array: the array md2 is not assembled, so it is not found; its "
              "superblocks stay on sda3, nvme0n1p3: recovery.md, rows 11 to 13\n");
}

TEST(Warnings, OtherRunUnseenDiskAndBadEnd)
{
    INVENTORY inventory;
    inventory.disks = {DataDisk("sda"), DataDisk("sdb")};
    HOST host;
    host.otherRuns = {17};
    RUN run = RunOf(WIPE);
    run.status = SIGKILL;
    EXPECT_EQ(Said(inventory, run, {"initsys"}, host),
              "other-run: arrayctl runs at this moment, as process 17\n"
              "unseen-disk: the command does not look at /dev/sdb\n"
              "bad-end: the tool was ended by signal 9\n");
}

} // namespace
