// SPDX-License-Identifier: MIT
//
// The command as scripts run it: what it prints, how it ends, what it runs, what it leaves.
#include "removal_machine.h"

#include <cerrno>
#include <csignal>
#include <gtest/gtest.h>
#include <string>
#include <vector>

namespace
{

constexpr char PVS[] = "/sbin/pvs -o pv_name,vg_name,lv_name,origin --noheading --separator :";
constexpr char ROW_MD2[] = "  /dev/md2:vg1:lv1:\n";
constexpr char STOP_MD2[] = "/sbin/mdadm -S /dev/md2";

constexpr char MIRROR_WIPED_TOLD[] =
    "<11>raid_remove.cpp:# [Info] clean RAID superblock of /dev/md2\n"
    "<11>raid_remove.cpp:# [Info] Clean RAID superblock on '/dev/sda3'\n"
    "<11>raid_remove.cpp:# [Info] Clean RAID superblock on '/dev/sdb3'\n";

const std::vector<std::string> MIRROR_REMOVAL = {"/sbin/mdadm -E /dev/sdb3",
                                                 "/sbin/mdadm -S /dev/md2",
                                                 "/sbin/mdadm -E /dev/sda3",
                                                 "/sbin/mdadm -E /dev/sdb3",
                                                 "/sbin/mdadm --zero-superblock /dev/sda3",
                                                 "/sbin/mdadm --zero-superblock /dev/sdb3"};

std::string Transcript(std::vector<std::string> first, const std::vector<std::string> &then)
{
    first.insert(first.begin(), PVS);
    first.insert(first.end(), then.begin(), then.end());
    return Lines(first);
}

void PvsExpect(MACHINE &machine, const std::string &szRows)
{
    MachineTool(machine, PVS, {.szOut = szRows});
}

void MirrorRemovalExpect(MACHINE &machine)
{
    ExamineExpect(machine, "sdb3", UUID_MD2, 2);
    MachineTool(machine, STOP_MD2);
    ExamineExpect(machine, "sda3", UUID_MD2);
    MachineTool(machine, WipeCommand("sda3"));
    MachineTool(machine, WipeCommand("sdb3"));
}

// What destroy prints, with exit status 0 and nothing on standard error.
RUN_RESULT Destroy(const MACHINE &machine, const std::string &szId, const std::string &szOut)
{
    const RUN_RESULT result = MachineRun(machine, {"destroy", szId});
    EXPECT_EQ(result.szOut, szOut);
    EXPECT_EQ(result.szErr, "");
    EXPECT_EQ(result.status, 0);
    return result;
}

// ---- without LVM -------------------------------------------------------------------------------

TEST(Destroy, AnArraySaysNothing)
{
    MACHINE machine = MachineWithMirror();
    PvsExpect(machine, "  /dev/sda5:vg0:root:\n");
    MirrorRemovalExpect(machine);
    const RUN_RESULT result = Destroy(machine, "2", "");
    EXPECT_EQ(TranscriptText(result), Transcript({}, MIRROR_REMOVAL));
    EXPECT_EQ(LogText(result), MIRROR_WIPED_TOLD);
    EXPECT_EQ(MachineFileRead("/var/log/space_operation_error.log"), std::nullopt);
}

TEST(Destroy, TheLogNamesTheProgram)
{
    MACHINE machine = MachineWithMirror();
    PvsExpect(machine, "");
    MirrorRemovalExpect(machine);
    const RUN_RESULT result = MachineRun(machine, {"destroy", "2"});
    EXPECT_EQ(result.log.size(), 3U);
    for (const LOG_LINE &line : result.log) {
        EXPECT_EQ(line.szTag, "arrayctl");
        EXPECT_TRUE(line.szText.starts_with("raid_remove.cpp:# ")) << line.szText;
    }
}

TEST(Destroy, AMissingArrayIsToldAndNoFailure)
{
    MACHINE machine = MachineMake();
    PvsExpect(machine, "");
    const RUN_RESULT result = Destroy(machine, "3", "Not found /dev/md3 \n");
    EXPECT_EQ(TranscriptText(result), std::string(PVS) + "\n");
    EXPECT_EQ(LogText(result),
              "<15>raid_info.cpp:# Failed to open /dev/md3, errno=No such file or directory\n");
}

TEST(Destroy, AnInactiveArrayIsAMissingOne)
{
    MACHINE machine = MachineWithMirror();
    machine.arrays[0].errnoInfo = ENODEV;
    PvsExpect(machine, "");
    const RUN_RESULT result = Destroy(machine, "2", "Not found /dev/md2 \n");
    EXPECT_EQ(TranscriptText(result), std::string(PVS) + "\n");
    EXPECT_EQ(LogText(result),
              "<15>raid_info.cpp:# Failed to ioctl for raid status, errno=No such device\n"
              "<15>raid_info.cpp:# Failed to ioctl for raid status, errno=0X8000\n");
}

TEST(Destroy, OtherArraysOnTheSameDisksAreLeftAlone)
{
    MACHINE machine = MachineMake();
    for (const char *const szDisk : {"sda", "sdb"}) {
        DiskWithPartitionsAdd(machine, szDisk, 4);
    }
    MachineMdAdd(machine, {.nMd = 2, .members = {{"sda3"}, {"sdb3"}}});
    MachineMdAdd(machine, {.nMd = 3, .members = {{"sda4"}, {"sdb4"}}});
    PvsExpect(machine, "");
    ExamineExpect(machine, "sda4", UUID_MD3);
    ExamineExpect(machine, "sdb4", UUID_MD3);
    MirrorRemovalExpect(machine);
    const RUN_RESULT result = Destroy(machine, "2", "");
    EXPECT_EQ(TranscriptText(result),
              Transcript({}, {"/sbin/mdadm -E /dev/sdb3", STOP_MD2, "/sbin/mdadm -E /dev/sda3",
                              "/sbin/mdadm -E /dev/sda4", "/sbin/mdadm -E /dev/sdb3",
                              "/sbin/mdadm -E /dev/sdb4", "/sbin/mdadm --zero-superblock /dev/sda3",
                              "/sbin/mdadm --zero-superblock /dev/sdb3"}));
    EXPECT_EQ(LogText(result), MIRROR_WIPED_TOLD);
}

// Even when it carries the array's UUID, a system or swap partition is not looked at.
TEST(Destroy, ASystemArrayIsStoppedAndKeepsItsSuperblocks)
{
    MACHINE machine = MachineMake();
    for (const char *const szDisk : {"sda", "sdb"}) {
        DiskWithPartitionsAdd(machine, szDisk, 3);
    }
    MachineMdAdd(machine, {.nMd = 0, .members = {{"sda1"}, {"sdb1"}}});
    PvsExpect(machine, "");
    ExamineExpect(machine, "sdb1", UUID_MD2);
    MachineTool(machine, "/sbin/mdadm -S /dev/md0");
    ExamineExpect(machine, "sda3", UUID_MD3);
    BlankMemberExpect(machine, "sdb3");
    const RUN_RESULT result = Destroy(machine, "0", "");
    EXPECT_EQ(TranscriptText(result),
              Transcript({}, {"/sbin/mdadm -E /dev/sdb1", "/sbin/mdadm -S /dev/md0",
                              "/sbin/mdadm -E /dev/sda3", "/sbin/mdadm -E /dev/sdb3"}));
    EXPECT_EQ(LogText(result), "<11>raid_remove.cpp:# [Info] clean RAID superblock of /dev/md0\n");
}

TEST(Destroy, AnArrayThatCannotBeStoppedIsNoFailure)
{
    MACHINE machine = MachineWithMirror();
    PvsExpect(machine, "");
    ExamineExpect(machine, "sdb3", UUID_MD2);
    MachineTool(machine, STOP_MD2,
                {.szErr = "mdadm: Cannot get exclusive access to /dev/md2:Perhaps a running "
                          "process, mounted filesystem or active volume group?\n",
                 .status = 1,
                 .nTimes = 3});
    const RUN_RESULT result = Destroy(machine, "2", "");
    EXPECT_EQ(TranscriptText(result),
              Transcript({}, {"/sbin/mdadm -E /dev/sdb3", STOP_MD2, "sleep 1", STOP_MD2, "sleep 1",
                              STOP_MD2, "sleep 1"}));
    const std::string szTry = "<11>raid_remove.cpp:# Failed to mdadm stop '/dev/md2'\n"
                              "<11>raid_remove.cpp:# Fail to stop [/dev/md2], try again\n";
    EXPECT_EQ(LogText(result),
              szTry + szTry + szTry + "<11>raid_remove.cpp:# Reach RAID stop retry limit\n");
    const std::string szError =
        "<time> command=\"/sbin/mdadm -S /dev/md2\" Error=\"mdadm: Cannot get exclusive access to "
        "/dev/md2:Perhaps a running process, mounted filesystem or active volume group? \"\n";
    EXPECT_EQ(OperationErrors(), szError + szError + szError);
}

TEST(Destroy, AFailedWipeIsNoFailure)
{
    MACHINE machine = MachineWithMirror();
    PvsExpect(machine, "");
    ExamineExpect(machine, "sdb3", UUID_MD2, 2);
    MachineTool(machine, STOP_MD2);
    ExamineExpect(machine, "sda3", UUID_MD2);
    MachineTool(
        machine, WipeCommand("sda3"),
        {.szErr = "mdadm: Couldn't open /dev/sda3\nfor write - not zeroing\n", .status = 2});
    const RUN_RESULT result = Destroy(machine, "2", "");
    EXPECT_EQ(LogText(result), "<11>raid_remove.cpp:# [Info] clean RAID superblock of /dev/md2\n"
                               "<11>raid_remove.cpp:# Failed to zero RAID superblock '/dev/sda3'\n"
                               "<11>raid_remove.cpp:# Failed to clean suerblock of '/dev/sda3'\n");
    EXPECT_EQ(OperationErrors(),
              "<time> command=\"/sbin/mdadm --zero-superblock /dev/sda3\" "
              "Error=\"mdadm: Couldn't open /dev/sda3 for write - not zeroing \"\n");
}

TEST(Destroy, WarningsOfToolsThatSucceedAreKept)
{
    MACHINE machine = MachineWithMirror();
    MachineFile(machine, "/var/log/space_operation_error.log", "an older line\n");
    PvsExpect(machine, "");
    ExamineExpect(machine, "sdb3", UUID_MD2, 2);
    MachineTool(machine, STOP_MD2,
                {.szOut = "not asked for\n", .szErr = "mdadm: stopped /dev/md2\n"});
    ExamineExpect(machine, "sda3", UUID_MD2);
    MachineTool(machine, WipeCommand("sda3"), {.szErr = "one\ntwo\n"});
    MachineTool(machine, WipeCommand("sdb3"), {.szErr = "no line end"});
    const RUN_RESULT result = Destroy(machine, "2", "");
    EXPECT_EQ(LogText(result), MIRROR_WIPED_TOLD);
    EXPECT_EQ(OperationErrors(),
              "an older line\n"
              "<time> command=\"/sbin/mdadm -S /dev/md2\" Error=\"mdadm: stopped /dev/md2 \"\n"
              "<time> command=\"/sbin/mdadm --zero-superblock /dev/sda3\" Error=\"one two \"\n"
              "<time> command=\"/sbin/mdadm --zero-superblock /dev/sdb3\" Error=\"no line end\"\n");
}

TEST(Destroy, AFloodOfErrorsDoesNotBlock)
{
    constexpr size_t FLOOD = 10 * 1024 * 1024;
    MACHINE machine = MachineWithMirror();
    machine.msBound = 60000; // that much text takes a while on a machine that is shared
    PvsExpect(machine, "");
    ExamineExpect(machine, "sdb3", UUID_MD2, 2);
    MachineTool(machine, STOP_MD2, {.cbFlood = FLOOD});
    ExamineExpect(machine, "sda3", UUID_MD2);
    MachineTool(machine, WipeCommand("sda3"));
    MachineTool(machine, WipeCommand("sdb3"));
    const RUN_RESULT result = Destroy(machine, "2", "");
    EXPECT_EQ(LogText(result), MIRROR_WIPED_TOLD);
    // The whole line is cut to 2047 bytes, so the closing quote is not there.
    const std::string szLog = MachineFileRead("/var/log/space_operation_error.log").value_or("");
    EXPECT_EQ(szLog.size(), 2048U);
    EXPECT_EQ(szLog.substr(2040), "xxxxxxx\n");
}

TEST(Destroy, WithoutMdadmTheArrayStays)
{
    MACHINE machine = MachineWithMirror();
    machine.tools["/sbin/mdadm"] = TOOL_KIND::MISSING;
    PvsExpect(machine, "");
    const RUN_RESULT result = Destroy(machine, "2", "");
    EXPECT_EQ(TranscriptText(result), Transcript({}, {"sleep 1", "sleep 1", "sleep 1"}));
    const std::string szTry = "<11>raid_remove.cpp:# Failed to mdadm stop '/dev/md2'\n"
                              "<11>raid_remove.cpp:# Fail to stop [/dev/md2], try again\n";
    EXPECT_EQ(LogText(result),
              "<11>raid_remove.cpp:# Disk [/dev/sdb3] in RAID [/dev/md2] has no RAID superblock, "
              "ret=0\n" +
                  szTry + szTry + szTry + "<11>raid_remove.cpp:# Reach RAID stop retry limit\n");
}

// ---- with LVM ----------------------------------------------------------------------------------

const std::vector<std::string> LVM_REMOVAL = {
    "/sbin/lvremove -f /dev/vg1/lv1", "/sbin/vgremove -f /dev/vg1", "/sbin/pvremove -f /dev/md2"};

TEST(Destroy, TheLvmStackGoesFirstAndInSilence)
{
    MACHINE machine = MachineWithMirror();
    MachineFile(machine, "/proc/mounts",
                "rootfs / rootfs rw 0 0\n/dev/vg1/lv1s1 /volume1 ext4 rw 0 0\n");
    MachineFolder(machine, "/volume1");
    PvsExpect(machine, ROW_MD2);
    MachineTool(machine, "/bin/umount -R -A -k /volume1");
    MachineTool(machine, "/sbin/lvremove -f /dev/vg1/lv1s1");
    for (const std::string &szCommand : LVM_REMOVAL) {
        MachineTool(machine, szCommand);
    }
    MirrorRemovalExpect(machine);
    const RUN_RESULT result = Destroy(machine, "2", "");
    std::vector<std::string> first = {"/bin/umount -R -A -k /volume1", "sleep 1",
                                      "/sbin/lvremove -f /dev/vg1/lv1s1"};
    first.insert(first.end(), LVM_REMOVAL.begin(), LVM_REMOVAL.end());
    EXPECT_EQ(TranscriptText(result), Transcript(first, MIRROR_REMOVAL));
    EXPECT_EQ(LogText(result), MIRROR_WIPED_TOLD);
}

// Removers that fail are no failure of the teardown, so nothing is printed and nobody waits.
TEST(Destroy, LvmRemoversThatFailAreNotPrinted)
{
    MACHINE machine = MachineWithMirror();
    PvsExpect(machine, ROW_MD2);
    for (const std::string &szCommand : LVM_REMOVAL) {
        MachineTool(machine, szCommand, {.status = 5});
    }
    MirrorRemovalExpect(machine);
    const RUN_RESULT result = Destroy(machine, "2", "");
    EXPECT_EQ(TranscriptText(result), Transcript(LVM_REMOVAL, MIRROR_REMOVAL));
    EXPECT_EQ(LogText(result),
              std::string("<11>lvm.cpp:# Failed to /sbin/lvremove -f /dev/vg1/lv1\n"
                          "<11>lvm.cpp:# Failed to /sbin/vgremove -f /dev/vg1\n"
                          "<11>lvm.cpp:# Failed to /sbin/pvremove -f /dev/md2\n") +
                  MIRROR_WIPED_TOLD);
}

TEST(Destroy, ATeardownThatCannotStartIsPrintedAndWaitedFor)
{
    MACHINE machine = MachineWithMirror();
    MachineRemove(machine, "/proc/mounts");
    PvsExpect(machine, ROW_MD2);
    MirrorRemovalExpect(machine);
    const RUN_RESULT result = Destroy(machine, "2", "Found LVM on /dev/md2, remove it \n");
    EXPECT_EQ(TranscriptText(result), Transcript({"sleep 3"}, MIRROR_REMOVAL));
    EXPECT_EQ(LogText(result),
              std::string("<11>lvm.cpp:# Failed to open /proc/mounts\n") + MIRROR_WIPED_TOLD);
}

TEST(Destroy, ATeardownThatCannotStartAndAMissingArray)
{
    MACHINE machine = MachineMake();
    MachineRemove(machine, "/proc/mounts");
    PvsExpect(machine, ROW_MD2);
    const RUN_RESULT result =
        Destroy(machine, "2", "Found LVM on /dev/md2, remove it \nNot found /dev/md2 \n");
    EXPECT_EQ(TranscriptText(result), Transcript({"sleep 3"}, {}));
}

TEST(Destroy, LvmOfAMissingArrayIsTakenDown)
{
    MACHINE machine = MachineMake();
    PvsExpect(machine, ROW_MD2);
    for (const std::string &szCommand : LVM_REMOVAL) {
        MachineTool(machine, szCommand);
    }
    const RUN_RESULT result = Destroy(machine, "2", "Not found /dev/md2 \n");
    EXPECT_EQ(TranscriptText(result), Transcript(LVM_REMOVAL, {}));
}

// ---- again -------------------------------------------------------------------------------------

TEST(Destroy, ASecondRunFindsNothingMoreToDo)
{
    MACHINE machine = MachineWithMirror();
    PvsExpect(machine, "");
    ExamineExpect(machine, "sdb3", UUID_MD2, 2);
    MachineTool(machine, STOP_MD2, {.removes = {"/dev/md2"}});
    ExamineExpect(machine, "sda3", UUID_MD2);
    MachineTool(machine, WipeCommand("sda3"));
    MachineTool(machine, WipeCommand("sdb3"));
    Destroy(machine, "2", "");
    machine.rows.clear();
    PvsExpect(machine, "");
    const RUN_RESULT again = MachineRunAgain(machine, {"destroy", "2"});
    EXPECT_EQ(again.szOut, "Not found /dev/md2 \n");
    EXPECT_EQ(again.status, 0);
    EXPECT_EQ(TranscriptText(again), std::string(PVS) + "\n");
}

} // namespace
