// SPDX-License-Identifier: MIT
#include "nurostoragecore/lvm.h"

#include "removal_machine.h"

#include <cerrno>
#include <climits>
#include <csignal>
#include <gtest/gtest.h>
#include <string>
#include <syslog.h>
#include <unistd.h>
#include <vector>

namespace
{

constexpr char PVS[] = "/sbin/pvs -o pv_name,vg_name,lv_name,origin --noheading --separator :";

// What pvs lists, with the two blanks that it sets in front.
MACHINE MachineWithRows(const std::string &szRows)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, PVS, {.szOut = szRows});
    return machine;
}

// ---- looking it up -----------------------------------------------------------------------------

struct ROW_CASE {
    const char *szRows;
    int result;
    const char *szPath;
    const char *szLog;
};

constexpr char NO_PATH[] = "before";

constexpr ROW_CASE ROW_CASES[] = {
    {"  /dev/md2:vg1:lv1:\n", 0, "/dev/vg1/lv1", ""},
    {"  /dev/md2:vg1:lv1:origin\n", 0, "/dev/vg1/lv1", ""},
    {"  /dev/md2:vg1:lv1:a:b:c\n", 0, "/dev/vg1/lv1", ""},
    {"  /dev/md2:vg1:lv1:", 0, "/dev/vg1/lv1", ""},
    {"  /dev/sda5:vg0:root:\n  /dev/md2:vg1:lv1:\n  /dev/sdb5:vg0:home:\n", 0, "/dev/vg1/lv1", ""},
    // Of several volumes the last one counts, and free space is a row too.
    {"  /dev/md2:vg1:lv1:\n  /dev/md2:vg1:lv2:\n", 0, "/dev/vg1/lv2", ""},
    {"  /dev/md2:vg1:lv2:\n  /dev/md2:vg1:lv1:\n", 0, "/dev/vg1/lv1", ""},
    {"  /dev/md2:vg1:lv1:\n  /dev/md2:vg1::\n", 0, "/dev/vg1/", ""},
    {"  /dev/md2:::\n", 0, "/dev//", ""},
    {"  /dev/md2:vg1:lv1:\n  /dev/md2\n", -1, NO_PATH,
     "<11>lvm.cpp:# Invalid pvs result [  /dev/md2\n]. separator ':' not found\n"},
    // Anywhere in the row.
    {"  /dev/md20:vg20:lv20:\n", 0, "/dev/vg20/lv20", ""},
    {"  /dev/md2:vg1:lv1:\n  /dev/md21:vg21:lv21:\n", 0, "/dev/vg21/lv21", ""},
    {"  /dev/sda5:vg0:lv0:/dev/md2\n", 0, "/dev/vg0/lv0", ""},
    // None.
    {"", -1, NO_PATH, ""},
    {"\n", -1, NO_PATH, ""},
    {"  /dev/md1:vg1:lv1:\n  /dev/sda5:vg0:root:\n", -1, NO_PATH, ""},
    {"  /dev/MD2:vg1:lv1:\n", -1, NO_PATH, ""},
    // Rows that are cut short.
    {"  /dev/md2\n", -1, NO_PATH,
     "<11>lvm.cpp:# Invalid pvs result [  /dev/md2\n]. separator ':' not found\n"},
    {"  /dev/md2", -1, NO_PATH,
     "<11>lvm.cpp:# Invalid pvs result [  /dev/md2]. separator ':' not found\n"},
    {"  /dev/md2:vg1\n", -1, NO_PATH, "<11>lvm.cpp:# pvg=vg1\n\n"},
    {"  /dev/md2:", -1, NO_PATH, "<11>lvm.cpp:# pvg=\n"},
    {"  /dev/md2:vg1:lv1\n", -1, NO_PATH, "<11>lvm.cpp:# plv=lv1\n\n"},
    {"  /dev/md2:vg1:", -1, NO_PATH, "<11>lvm.cpp:# plv=\n"},
};

TEST(LVMGetLVPath, IsThatOfTheLastRowWithTheDevice)
{
    for (const ROW_CASE &row : ROW_CASES) {
        const RUN_RESULT result = MachineCall(MachineWithRows(row.szRows), [&row] {
            char szPath[256] = "before";
            RecordReset();
            EXPECT_EQ(LVMGetLVPath("/dev/md2", szPath, sizeof(szPath)), row.result) << row.szRows;
            EXPECT_STREQ(szPath, row.szPath) << row.szRows;
            EXPECT_EQ(NLIBCErrGet(), OLD_CODE) << row.szRows;
        });
        EXPECT_EQ(LogText(result), row.szLog) << row.szRows;
        EXPECT_EQ(TranscriptText(result), std::string(PVS) + "\n");
    }
}

// As many as 1023 characters, the last separator among them, and a longer row comes in pieces.
TEST(LVMGetLVPath, ARowMayFillTheWholeLine)
{
    const std::string szRow = "/dev/md2:vg1:lv1:";
    const struct {
        size_t nBlank;
        int result;
    } cases[] = {{1023 - szRow.size(), 0}, {1019, -1}, {1023, 0}};
    for (const auto &row : cases) {
        SCOPED_TRACE(row.nBlank);
        MachineCall(MachineWithRows(std::string(row.nBlank, ' ') + szRow + "origin\n"), [&row] {
            char szPath[256] = "before";
            EXPECT_EQ(LVMGetLVPath("/dev/md2", szPath, sizeof(szPath)), row.result);
            EXPECT_STREQ(szPath, row.result == 0 ? "/dev/vg1/lv1" : "before");
        });
    }
}

TEST(LVMGetLVPath, IsCutToTheBuffer)
{
    MachineCall(MachineWithRows("  /dev/md2:vg1:lv1:\n"), [] {
        char szPath[16] = "xxxxxxxxxxxxxxx";
        EXPECT_EQ(LVMGetLVPath("/dev/md2", szPath, 8), 0);
        EXPECT_STREQ(szPath, "/dev/vg");
        EXPECT_EQ(szPath[8], 'x');
    });
}

TEST(LVMGetLVPath, BadArgumentsRunNothing)
{
    const RUN_RESULT result = MachineCall(MachineMake(), [] {
        char szPath[256] = "before";
        RecordReset();
        EXPECT_EQ(LVMGetLVPath(nullptr, szPath, sizeof(szPath)), -1);
        EXPECT_EQ(LVMGetLVPath("/dev/md2", nullptr, sizeof(szPath)), -1);
        EXPECT_EQ(LVMGetLVPath("/dev/md2", szPath, 0), -1);
        EXPECT_EQ(LVMGetLVPath("/dev/md2", szPath, -1), -1);
        EXPECT_EQ(LVMGetLVPath("/dev/md2", szPath, INT_MIN), -1);
        EXPECT_EQ(LVMRmLVPath(nullptr), -1);
        EXPECT_STREQ(szPath, "before");
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
    EXPECT_EQ(OrderText(result), "");
}

TEST(LVMGetLVPath, WarningsAndTheStatusAreNotAsked)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, PVS,
                {.szOut = "  /dev/md2:vg1:lv1:\n",
                 .szErr = "  WARNING: /dev/md2:wrong:wrong: is missing\n",
                 .status = 5});
    const RUN_RESULT result = MachineCall(machine, [] {
        char szPath[256] = "";
        EXPECT_EQ(LVMGetLVPath("/dev/md2", szPath, sizeof(szPath)), 0);
        EXPECT_STREQ(szPath, "/dev/vg1/lv1");
    });
    EXPECT_EQ(OperationErrors(), "");
    ASSERT_EQ(result.events.size(), 1U);
    EXPECT_TRUE(result.events[0].fNullInput);
    EXPECT_TRUE(result.events[0].fNullError);
    EXPECT_EQ(result.events[0].nDescriptors, 0);
}

TEST(LVMGetLVPath, TheStreamIsClosedOnEveryWayOut)
{
    for (const char *const szRows : {"", "  /dev/md2\n", "  /dev/md2:vg1\n", "  /dev/md2:vg1:lv1\n",
                                     "  /dev/md2:vg1:lv1:\n"}) {
        MachineCall(MachineWithRows(szRows), [] {
            openlog(nullptr, LOG_NDELAY, LOG_USER); // so that the log takes no new descriptor
            const int fdBefore = dup(STDIN_FILENO);
            char szPath[256] = "";
            (void)LVMGetLVPath("/dev/md2", szPath, sizeof(szPath));
            EXPECT_EQ(dup(STDIN_FILENO), fdBefore + 1);
        });
    }
}

TEST(LVMGetLVPath, ACommandThatCannotBeStartedIsTold)
{
    MACHINE machine = MachineMake();
    machine.faults = {{.szFunction = "pipe2", .error = EMFILE, .fGoOn = true}};
    const RUN_RESULT result = MachineCall(machine, [] {
        char szPath[256] = "before";
        RecordReset();
        EXPECT_EQ(LVMGetLVPath("/dev/md2", szPath, sizeof(szPath)), -1);
        EXPECT_STREQ(szPath, "before");
        EXPECT_EQ(NLIBCErrGet(), ERR_PIPE_FAILED);
        RecordReset();
        EXPECT_EQ(LVMRmLVPath("/dev/md2"), 0); // as if there was none
        EXPECT_EQ(NLIBCErrGet(), ERR_PIPE_FAILED);
    });
    const std::string szTold = "<11>lvm.cpp:# Fail to do [/sbin/pvs -o "
                               "pv_name,vg_name,lv_name,origin --noheading --separator :]\n";
    EXPECT_EQ(LogText(result), szTold + szTold);
}

// ---- taking it down ----------------------------------------------------------------------------

constexpr char ROW_MD2[] = "  /dev/md2:vg1:lv1:\n";

STEPS Pvs(const std::string &szRows)
{
    return {{PVS, {.szOut = szRows}}};
}

const STEP LV_FAILED = {"<11>lvm.cpp:# Failed to /sbin/lvremove -f /dev/vg1/lv1"};
const STEP VG_FAILED = {"<11>lvm.cpp:# Failed to /sbin/vgremove -f /dev/vg1"};
const STEP PV_FAILED = {"<11>lvm.cpp:# Failed to /sbin/pvremove -f /dev/md2"};
const STEPS REMOVED = {{"/sbin/lvremove -f /dev/vg1/lv1"},
                       {"/sbin/vgremove -f /dev/vg1"},
                       {"/sbin/pvremove -f /dev/md2"}};

long long Remove()
{
    return LVMRmLVPath("/dev/md2");
}

TEST(LVMRmLVPath, WithoutAWholeRowNothingIsRun)
{
    ExpectCalls({{.szName = "no row", .call = Remove, .steps = Pvs("")},
                 {.szName = "another device",
                  .call = Remove,
                  .steps = Pvs("  /dev/md1:vg1:lv1:\n  /dev/sdb5:vg0:root:\n")},
                 {.szName = "a broken row",
                  .call = Remove,
                  .steps = Pvs("  /dev/md2:vg1\n") + STEPS{{"<11>lvm.cpp:# pvg=vg1\n"}}},
                 {.szName = "no tool",
                  .machine = WithTool(MachineMake(), "/sbin/pvs", TOOL_KIND::MISSING),
                  .call = Remove},
                 {.szName = "no mount table",
                  .machine = Without(MachineMake(), "/proc/mounts"),
                  .call = Remove,
                  .result = -1,
                  .steps = Pvs(ROW_MD2) + STEPS{{"<11>lvm.cpp:# Failed to open /proc/mounts"}}}});
}

TEST(LVMRmLVPath, RemovesVolumeGroupAndPhysicalVolume)
{
    ExpectCalls(
        {{.szName = "a volume", .call = Remove, .steps = Pvs(ROW_MD2) + REMOVED},
         // A group with free space has no volume in its last row.
         {.szName = "free space",
          .call = Remove,
          .steps = Pvs("  /dev/md2:vg1:lv1:\n  /dev/md2:vg1::\n") +
                   STEPS{{"/sbin/lvremove -f /dev/vg1/"},
                         {"/sbin/vgremove -f /dev/vg1"},
                         {"/sbin/pvremove -f /dev/md2"}}},
         // A longer number is taken for the device.
         {.szName = "md20",
          .call = Remove,
          .steps = Pvs("  /dev/md20:vg20:lv20:\n") + STEPS{{"/sbin/lvremove -f /dev/vg20/lv20"},
                                                           {"/sbin/vgremove -f /dev/vg20"},
                                                           {"/sbin/pvremove -f /dev/md2"}}}});
}

TEST(LVMRmLVPath, EveryFailureIsToldAndNoneEndsIt)
{
    MACHINE missing = MachineMake();
    for (const char *const szTool : {"/sbin/lvremove", "/sbin/vgremove", "/sbin/pvremove"}) {
        missing.tools[szTool] = TOOL_KIND::MISSING;
    }
    ExpectCalls(
        {{.szName = "missing tools",
          .machine = missing,
          .call = Remove,
          .steps = Pvs(ROW_MD2) + STEPS{LV_FAILED, VG_FAILED, PV_FAILED}},
         // What the runner could not even start it has on record itself.
         {.szName = "no pipe",
          .machine = WithFault(MachineMake(),
                               {.szFunction = "pipe2", .nCall = 2, .error = EMFILE, .fGoOn = true}),
          .call = Remove,
          .code = ERR_BAD_PARAMETER,
          .steps = Pvs(ROW_MD2) + STEPS{{"fault pipe2 2"}, {"fault pipe2 3"}, {"fault pipe2 4"}}},
         {.szName = "each in its way",
          .call = Remove,
          .steps = Pvs(ROW_MD2) + STEPS{{REMOVED[0].szText, {.szErr = "  in use\n", .status = 5}},
                                        LV_FAILED,
                                        {REMOVED[1].szText, {.status = 1}},
                                        VG_FAILED,
                                        {REMOVED[2].szText, {.signal = 9}},
                                        PV_FAILED}}});
    EXPECT_EQ(OperationErrors(),
              "Nov 05 01:02:03 command=\"/sbin/lvremove -f /dev/vg1/lv1\" Error=\"  in use \"\n");
}

// ---- mounts ------------------------------------------------------------------------------------

// A volume that is mounted there, and its folder is empty.
STEPS Unmounted(const std::string &szVolume, const std::string &szFolder)
{
    return {{"/bin/umount -R -A -k " + szFolder}, {"sleep 1"}, {"/sbin/lvremove -f " + szVolume}};
}

// With these mounts, on empty folders, the volume lv1 is taken down so, and the folders are gone.
void ExpectMounts(const char *szName, const std::string &szMounts,
                  const std::vector<std::string> &folders, const STEPS &steps)
{
    MACHINE machine = WithFile(MachineMake(), "/proc/mounts", szMounts);
    for (const std::string &szFolder : folders) {
        MachineFolder(machine, szFolder);
    }
    const auto call = [&folders] {
        const int result = LVMRmLVPath("/dev/md2");
        for (const std::string &szFolder : folders) {
            EXPECT_EQ(access(szFolder.c_str(), F_OK), szFolder == "/stays" ? 0 : -1) << szFolder;
        }
        return result;
    };
    (void)ExpectCall({.szName = szName,
                      .machine = machine,
                      .call = call,
                      .steps = Pvs(ROW_MD2) + steps + REMOVED});
}

TEST(LVMRmLVPath, UnmountsInTheOrderOfTheTable)
{
    ExpectMounts("two of four",
                 "rootfs / rootfs rw 0 0\n"
                 "/dev/vg1/lv1s2 /volume2 ext4 rw 0 0\n"
                 "/dev/sda1 /boot ext4 rw 0 0\n"
                 "/dev/vg1/lv1s1 /volume1 xfs rw 0 0\n",
                 {"/volume1", "/volume2"},
                 Unmounted("/dev/vg1/lv1s2", "/volume2") + Unmounted("/dev/vg1/lv1s1", "/volume1"));
}

TEST(LVMRmLVPath, MountsOfOtherDevicesAreLeftAlone)
{
    ExpectMounts("none of seven",
                 "/dev/vg1/lv1 /volume1 ext4 rw 0 0\n"
                 "/dev/vg1/lv10 /volume2 ext4 rw 0 0\n"
                 "/dev/vg1/lv1-s1 /volume3 ext4 rw 0 0\n"
                 "/dev/vg1/lv1S1 /volume4 ext4 rw 0 0\n"
                 "/dev/vg1 /volume5 ext4 rw 0 0\n"
                 "x/dev/vg1/lv1s1 /volume6 ext4 rw 0 0\n"
                 "tmpfs /dev/vg1/lv1s1 tmpfs rw 0 0\n",
                 {}, {});
}

TEST(LVMRmLVPath, AufsMountsAreLeftAlone)
{
    ExpectMounts("one of three",
                 "/dev/vg1/lv1s1 /stays aufs rw 0 0\n"
                 "/dev/vg1/lv1s1 /volume1 aufs2 rw 0 0\n"
                 "/dev/vg1/lv1s /volume2 AUFS rw 0 0\n",
                 {"/stays", "/volume1", "/volume2"},
                 Unmounted("/dev/vg1/lv1s1", "/volume1") + Unmounted("/dev/vg1/lv1s", "/volume2"));
}

TEST(LVMRmLVPath, EscapesOfTheTableAreRead)
{
    MACHINE machine =
        WithFile(MachineMake(), "/proc/mounts", "/dev/vg1/lv1s1 /my\\040volume ext4 rw 0 0\n");
    MachineFolder(machine, "/my volume");
    MachineTool(machine, {"/bin/umount", "-R", "-A", "-k", "/my volume"});
    StepsExpect(machine, Pvs(ROW_MD2) + STEPS{{"/sbin/lvremove -f /dev/vg1/lv1s1"}} + REMOVED);
    QuietCall(machine, [] {
        EXPECT_EQ(LVMRmLVPath("/dev/md2"), 0);
        EXPECT_EQ(access("/my volume", F_OK), -1);
    });
}

TEST(LVMRmLVPath, EmptyFieldsAreTakenAsTheyAre)
{
    MACHINE machine = WithFile(MachineMake(), "/proc/mounts", "/dev//s1 /volume1 ext4 rw 0 0\n");
    MachineFolder(machine, "/volume1");
    (void)ExpectCall({.szName = "no group, no volume",
                      .machine = machine,
                      .call = Remove,
                      .steps = Pvs("  /dev/md2:::\n") + Unmounted("/dev//s1", "/volume1") +
                               STEPS{{"/sbin/lvremove -f /dev//"},
                                     {"/sbin/vgremove -f /dev/"},
                                     {"/sbin/pvremove -f /dev/md2"}}});
}

// Of a longer path the first 255 characters are the volume, and the "s" comes behind them.
TEST(LVMRmLVPath, AVolumePathIsCutTo255Characters)
{
    const std::string szVolume = "/dev/vg1/" + std::string(246, 'v');
    ASSERT_EQ(szVolume.size(), 255U);
    MACHINE machine =
        WithFile(MachineMake(), "/proc/mounts",
                 szVolume + "1 /volume1 ext4 rw 0 0\n" + szVolume + "s1 /volume2 ext4 rw 0 0\n");
    MachineFolder(machine, "/volume2");
    for (const char *const szBehind : {"", "w"}) {
        (void)ExpectCall(
            {.szName = "255 characters or more",
             .machine = machine,
             .call = Remove,
             .steps = Pvs("  /dev/md2:vg1:" + std::string(246, 'v') + szBehind + ":\n") +
                      Unmounted(szVolume + "s1", "/volume2") +
                      STEPS{{"/sbin/lvremove -f " + szVolume},
                            {"/sbin/vgremove -f /dev/vg1"},
                            {"/sbin/pvremove -f /dev/md2"}}});
    }
}

// Of a longer entry the first 4095 characters are read: a type that ends behind them is another.
TEST(LVMRmLVPath, AMountEntryIsCutTo4095Characters)
{
    const std::string szStart = "/dev/vg1/lv1s1 /volume1";
    const std::string szBlanks(4095 - szStart.size() - 4, ' ');
    ExpectMounts("it fits", szStart + szBlanks + "aufs rw 0 0\ntmpfs /tmp tmpfs rw 0 0\n", {}, {});
    ExpectMounts("cut", szStart + szBlanks + " aufs rw 0 0\n", {"/volume1"},
                 Unmounted("/dev/vg1/lv1s1", "/volume1"));
}

// ---- one mount ---------------------------------------------------------------------------------

const STEP UMOUNT = {"/bin/umount -R -A -k /volume1"};
const STEP MOUNT_LV = {"/sbin/lvremove -f /dev/vg1/lv1s1"};
// In the old words.
const STEP UMOUNT_FAILED = {"<11>lvm.cpp:# Failed to /bin/umount -f -k /volume1"};
const STEP RMDIR_FAILED = {"<11>lvm.cpp:# Failed to rmdir(/volume1)"};
const STEP MOUNT_LV_FAILED = {"<11>lvm.cpp:# Failed to /sbin/lvremove -f /dev/vg1/lv1s1"};
const STEP PAUSE = {"sleep 1"};

// A mounted volume whose folder can go.
MACHINE MachineWithMount()
{
    MACHINE machine =
        WithFile(MachineMake(), "/proc/mounts", "/dev/vg1/lv1s1 /volume1 ext4 rw 0 0\n");
    MachineFolder(machine, "/volume1");
    return machine;
}

void ExpectMount(const char *szName, const STEPS &steps,
                 const MACHINE &machine = MachineWithMount(), u32 code = OLD_CODE)
{
    (void)ExpectCall({.szName = szName,
                      .machine = machine,
                      .call = Remove,
                      .code = code,
                      .steps = Pvs(ROW_MD2) + steps + REMOVED});
}

// Told before the pause. The mount has a second to go before its folder is taken away.
TEST(LVMRmLVPath, EveryFailureOfAMountIsToldAndNoneEndsIt)
{
    ExpectMount("umount fails", {{UMOUNT.szText, {.szErr = "umount: busy\n", .status = 32}},
                                 UMOUNT_FAILED,
                                 PAUSE,
                                 MOUNT_LV});
    // umount does not go through the runner that keeps the operation errors.
    EXPECT_EQ(OperationErrors(), "");
    ExpectMount("no umount", {UMOUNT_FAILED, PAUSE, MOUNT_LV},
                WithTool(MachineWithMount(), "/bin/umount", TOOL_KIND::MISSING));
    ExpectMount("umount is killed", {{UMOUNT.szText, {.signal = SIGKILL}}, PAUSE, MOUNT_LV},
                MachineWithMount(), ERR_CHILD_FAILED);
    ExpectMount("a folder that stays", {UMOUNT, PAUSE, RMDIR_FAILED, MOUNT_LV},
                WithFile(MachineWithMount(), "/volume1/file", ""));
    EXPECT_EQ(MachineFileRead("/volume1/file"), "");
    ExpectMount("a busy folder", {UMOUNT, PAUSE, {"fault rmdir 1"}, RMDIR_FAILED, MOUNT_LV},
                WithFault(MachineWithMount(), {.szFunction = "rmdir", .error = EBUSY}));
    ExpectMount("a folder that is gone",
                {{UMOUNT.szText, {.removes = {"/volume1"}}}, PAUSE, RMDIR_FAILED, MOUNT_LV});
    ExpectMount("the removal is killed",
                {UMOUNT, PAUSE, {MOUNT_LV.szText, {.signal = SIGKILL}}, MOUNT_LV_FAILED});
    ExpectMount("all three",
                {{UMOUNT.szText, {.status = 1}},
                 UMOUNT_FAILED,
                 PAUSE,
                 RMDIR_FAILED,
                 {MOUNT_LV.szText, {.szErr = "  busy\n", .status = 5}},
                 MOUNT_LV_FAILED},
                WithFile(MachineWithMount(), "/volume1/file", ""));
    EXPECT_EQ(OperationErrors(),
              "Nov 05 01:02:03 command=\"/sbin/lvremove -f /dev/vg1/lv1s1\" Error=\"  busy \"\n");
}

TEST(LVMRmLVPath, TheUnmountHasNoStreamsAndOnlyThePath)
{
    MACHINE machine = MachineWithMount();
    machine.environment["SECRET"] = "1";
    StepsExpect(machine, Pvs(ROW_MD2) + STEPS{UMOUNT, MOUNT_LV} + REMOVED);
    const RUN_RESULT result = MachineCall(machine, [] { EXPECT_EQ(Remove(), 0); });
    ASSERT_GE(result.events.size(), 2U);
    const RUN_EVENT &unmount = result.events[1];
    EXPECT_EQ(unmount.argv[0], "/bin/umount");
    EXPECT_TRUE(unmount.fNullInput && unmount.fNullOutput && unmount.fNullError);
    EXPECT_EQ(unmount.environment, std::vector<std::string>{"PATH=/sbin:/bin"});
}

} // namespace
