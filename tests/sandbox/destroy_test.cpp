// SPDX-License-Identifier: MIT
//
// The command as scripts run it: what it prints, how it ends, what it runs, what it leaves.
#include "removal_machine.h"

#include <cerrno>
#include <csignal>
#include <gtest/gtest.h>
#include <string>

namespace
{

const STEPS NO_LVM = Pvs("");
const STEPS MIRROR_STOPPED = {Examined("sdb3", UUID_MD2), {STOP_MD2}};
const STEPS MIRROR_REMOVED = MIRROR_STOPPED + MirrorWiped();
const STEPS NO_MD2 = {
    {"<15>raid_info.cpp:# Failed to open /dev/md2, errno=No such file or directory"}};
const STEPS NO_MOUNTS = {{"<11>lvm.cpp:# Failed to open /proc/mounts"}, {"sleep 3"}};

RUN_RESULT ExpectDestroy(const char *szName, const MACHINE &machine, const std::string &szOut,
                         const STEPS &steps)
{
    return ExpectRun({szName, machine, {"destroy", "2"}, szOut, 0, steps});
}

// ---- without LVM -------------------------------------------------------------------------------

TEST(Destroy, AnArraySaysNothing)
{
    const RUN_RESULT result = ExpectDestroy("a mirror", MachineWithMirror(), "",
                                            Pvs("  /dev/sda5:vg0:root:\n") + MIRROR_REMOVED);
    EXPECT_EQ(OperationErrors(), "");
    for (const LOG_LINE &line : result.log) {
        EXPECT_EQ(line.szTag, "arrayctl");
    }
}

TEST(Destroy, AMissingArrayIsToldAndNoFailure)
{
    ExpectDestroy("no array", MachineMake(), "Not found /dev/md2 \n", NO_LVM + NO_MD2);
}

TEST(Destroy, AnInactiveArrayIsAMissingOne)
{
    MACHINE machine = MachineWithMirror();
    machine.arrays[0].errnoInfo = ENODEV;
    ExpectDestroy("inactive", machine, "Not found /dev/md2 \n",
                  NO_LVM +
                      STEPS{{"<15>raid_info.cpp:# Failed to ioctl for raid status, "
                             "errno=No such device"},
                            {"<15>raid_info.cpp:# Failed to ioctl for raid status, errno=0X8000"}});
}

TEST(Destroy, OtherArraysOnTheSameDisksAreLeftAlone)
{
    MACHINE machine = MachineWithDisks({"sda", "sdb"}, 4);
    MachineMdAdd(machine, {.nMd = 2, .members = {{"sda3"}, {"sdb3"}}});
    MachineMdAdd(machine, {.nMd = 3, .members = {{"sda4"}, {"sdb4"}}});
    ExpectDestroy("beside md3", machine, "",
                  NO_LVM + MIRROR_STOPPED +
                      STEPS{CLEAN_TOLD, Examined("sda3", UUID_MD2), Examined("sda4", UUID_MD3),
                            Examined("sdb3", UUID_MD2), Examined("sdb4", UUID_MD3)} +
                      Wiped("sda3") + Wiped("sdb3"));
}

// Even when it carries the array's UUID, a system or swap partition is not looked at.
TEST(Destroy, ASystemArrayIsStoppedAndKeepsItsSuperblocks)
{
    MACHINE machine = MachineWithDisks({"sda", "sdb"}, 3);
    MachineMdAdd(machine, {.nMd = 0, .members = {{"sda1"}, {"sdb1"}}});
    ExpectRuns({{.szName = "md0",
                 .machine = machine,
                 .arguments = {"destroy", "0"},
                 .steps = NO_LVM +
                          STEPS{Examined("sdb1", UUID_MD2),
                                {"/sbin/mdadm -S /dev/md0"},
                                {"<11>raid_remove.cpp:# [Info] clean RAID superblock of /dev/md0"},
                                Examined("sda3", UUID_MD3),
                                ExaminedBlank("sdb3")}}});
}

// Each try is told before the pause that follows it, and the superblocks are left alone.
TEST(Destroy, AnArrayThatCannotBeStoppedIsNoFailure)
{
    const TOOL_ANSWER busy = {
        .szErr = "mdadm: Cannot get exclusive access to /dev/md2:Perhaps a running process, "
                 "mounted filesystem or active volume group?\n",
        .status = 1};
    for (const TOOL_ANSWER &answer :
         {TOOL_ANSWER{.status = 255}, TOOL_ANSWER{.signal = SIGKILL},
          TOOL_ANSWER{.signal = SIGSEGV}, TOOL_ANSWER{.status = 1, .cbFlood = 1U << 20U}, busy}) {
        ExpectDestroy("no stop", MachineWithMirror(), "",
                      NO_LVM + STEPS{Examined("sdb3", UUID_MD2)} + 3 * StopFailed(answer) +
                          STEPS{LIMIT_TOLD});
    }
    const std::string szError =
        "Nov 05 01:02:03 command=\"/sbin/mdadm -S /dev/md2\" Error=\"mdadm: Cannot get exclusive "
        "access to /dev/md2:Perhaps a running process, mounted filesystem or active volume group? "
        "\"\n";
    EXPECT_EQ(OperationErrors(), szError + szError + szError);
}

TEST(Destroy, AFailedWipeIsNoFailure)
{
    ExpectDestroy("no wipe", MachineWithMirror(), "",
                  NO_LVM + MIRROR_STOPPED + MirrorExamined() +
                      WipeFailed("sda3", {.szErr = "mdadm: Couldn't open /dev/sda3\nfor write\n",
                                          .status = 2}));
    EXPECT_EQ(OperationErrors(),
              "Nov 05 01:02:03 command=\"/sbin/mdadm --zero-superblock /dev/sda3\" "
              "Error=\"mdadm: Couldn't open /dev/sda3 for write \"\n");
}

TEST(Destroy, WarningsOfToolsThatSucceedAreKept)
{
    STEPS steps = NO_LVM + MIRROR_REMOVED;
    for (STEP &step : steps) {
        if (step.szText.starts_with("/sbin/mdadm -")) {
            step.answer.szErr = step.szText.substr(12, 2) + "\nwarned\n";
        }
    }
    ExpectDestroy("warnings",
                  WithFile(MachineWithMirror(), "/var/log/space_operation_error.log", "older\n"),
                  "", steps);
    EXPECT_EQ(OperationErrors(),
              "older\n"
              "Nov 05 01:02:03 command=\"/sbin/mdadm -S /dev/md2\" Error=\"-S warned \"\n"
              "Nov 05 01:02:03 command=\"/sbin/mdadm --zero-superblock /dev/sda3\" "
              "Error=\"-- warned \"\n"
              "Nov 05 01:02:03 command=\"/sbin/mdadm --zero-superblock /dev/sdb3\" "
              "Error=\"-- warned \"\n");
}

TEST(Destroy, AFloodOnBothStreamsBlocksNobody)
{
    constexpr size_t FLOOD = 50UL * 1024UL * 1024UL;
    STEPS flooded = NO_LVM + MIRROR_STOPPED;
    flooded[0].answer.cbFlood = FLOOD;
    flooded[2].answer.cbFlood = FLOOD;
    ExpectDestroy("flood", MachineWithMirror(), "", flooded + MirrorWiped());
    // The whole line is cut to 2047 bytes, so the closing quote is not there.
    EXPECT_EQ(OperationErrors().size(), 2048U);
    EXPECT_EQ(OperationErrors().substr(2040), "xxxxxxx\n");
    EXPECT_EQ(OperationErrors().find('\n'), 2047U);
}

TEST(Destroy, WithoutToolsTheArrayStays)
{
    STEPS steps = STEPS{{"<11>raid_remove.cpp:# Disk [/dev/sdb3] in RAID [/dev/md2] has no RAID "
                         "superblock, ret=0"}} +
                  3 * StopFailed({}) + STEPS{LIMIT_TOLD};
    std::erase_if(steps, [](const STEP &step) { return step.szText == STOP_MD2; });
    for (const TOOL_KIND kind :
         {TOOL_KIND::MISSING, TOOL_KIND::FOLDER, TOOL_KIND::NOT_EXECUTABLE}) {
        const MACHINE machine = WithTool(MachineWithMirror(), "/sbin/mdadm", kind);
        ExpectDestroy("no mdadm", machine, "", NO_LVM + steps);
        ExpectDestroy("no pvs either", WithTool(machine, "/sbin/pvs", kind), "", steps);
    }
}

// ---- with LVM ----------------------------------------------------------------------------------

TEST(Destroy, TheLvmStackGoesFirstAndInSilence)
{
    MACHINE machine = WithFile(MachineWithMirror(), "/proc/mounts",
                               "rootfs / rootfs rw 0 0\n/dev/vg1/lv1s1 /volume1 ext4 rw 0 0\n");
    MachineFolder(machine, "/volume1");
    ExpectDestroy("mounted", machine, "",
                  Pvs(ROW_MD2) +
                      STEPS{{"/bin/umount -R -A -k /volume1"},
                            {"sleep 1"},
                            {"/sbin/lvremove -f /dev/vg1/lv1s1"}} +
                      LVM_REMOVED + MIRROR_REMOVED);
}

// Removers that fail are no failure of the teardown, so nothing is printed and nobody waits.
TEST(Destroy, LvmRemoversThatFailAreNotPrinted)
{
    ExpectDestroy("removers fail", MachineWithMirror(), "",
                  Pvs(ROW_MD2) + RemoversFailed({.status = 5}, {.status = 5}, {.status = 5}) +
                      MIRROR_REMOVED);
}

TEST(Destroy, ATeardownThatCannotStartIsPrintedAndWaitedFor)
{
    ExpectDestroy("no mounts", Without(MachineWithMirror(), "/proc/mounts"),
                  "Found LVM on /dev/md2, remove it \n", Pvs(ROW_MD2) + NO_MOUNTS + MIRROR_REMOVED);
}

// The array is looked up last, whatever became of the volumes.
TEST(Destroy, LvmOfAMissingArrayIsTakenDownFirst)
{
    ExpectDestroy("taken down", MachineMake(), "Not found /dev/md2 \n",
                  Pvs(ROW_MD2) + LVM_REMOVED + NO_MD2);
    ExpectDestroy("cannot start", Without(MachineMake(), "/proc"),
                  "Found LVM on /dev/md2, remove it \nNot found /dev/md2 \n",
                  Pvs(ROW_MD2) + NO_MOUNTS + NO_MD2);
}

// ---- again -------------------------------------------------------------------------------------

TEST(Destroy, ASecondRunFindsNothingMoreToDo)
{
    ExpectDestroy("first", MachineWithMirror(), "",
                  NO_LVM +
                      STEPS{Examined("sdb3", UUID_MD2), {STOP_MD2, {.removes = {"/dev/md2"}}}} +
                      MirrorWiped());
    MACHINE machine = MachineMake();
    StepsExpect(machine, NO_LVM);
    const RUN_RESULT again = MachineRunAgain(machine, {"destroy", "2"});
    EXPECT_EQ(again.szOut, "Not found /dev/md2 \n");
    EXPECT_EQ(again.status, 0);
    ExpectSteps(again, NO_LVM + NO_MD2);
}

} // namespace
