// SPDX-License-Identifier: MIT
#include "nurostoragecore/lvm.h"

#include "removal_machine.h"
#include "streams.h"

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

void Expect(const char *szName, const std::function<long long()> &call, const STEPS &steps,
            const MACHINE &machine = MachineMake(), u32 code = OLD_CODE, int result = 0)
{
    (void)ExpectCall({szName, machine, call, result, code, steps});
}

// ---- looking it up -----------------------------------------------------------------------------

struct ROW_CASE {
    const char *szRows;
    const char *szPath; // NO_PATH: it fails
    STEPS told = {};
};

constexpr char NO_PATH[] = "before";

const ROW_CASE ROW_CASES[] = {
    {"  /dev/md2:vg1:lv1:\n", "/dev/vg1/lv1"},
    {"  /dev/md2:vg1:lv1:origin\n", "/dev/vg1/lv1"},
    {"  /dev/md2:vg1:lv1:a:b:c\n", "/dev/vg1/lv1"},
    {"  /dev/md2:vg1:lv1:", "/dev/vg1/lv1"},
    {"  /dev/sda5:vg0:root:\n  /dev/md2:vg1:lv1:\n  /dev/sdb5:vg0:home:\n", "/dev/vg1/lv1"},
    // Of several volumes the last one counts, and free space is a row too.
    {"  /dev/md2:vg1:lv1:\n  /dev/md2:vg1:lv2:\n", "/dev/vg1/lv2"},
    {"  /dev/md2:vg1:lv2:\n  /dev/md2:vg1:lv1:\n", "/dev/vg1/lv1"},
    {"  /dev/md2:vg1:lv1:\n  /dev/md2:vg1::\n", "/dev/vg1/"},
    {"  /dev/md2:::\n", "/dev//"},
    {"  /dev/md2:vg1:lv1:\n  /dev/md2\n",
     NO_PATH,
     {{"<11>lvm.cpp:# Invalid pvs result [  /dev/md2\n]. separator ':' not found"}}},
    // Anywhere in the row.
    {"  /dev/md20:vg20:lv20:\n", "/dev/vg20/lv20"},
    {"  /dev/md2:vg1:lv1:\n  /dev/md21:vg21:lv21:\n", "/dev/vg21/lv21"},
    {"  /dev/sda5:vg0:lv0:/dev/md2\n", "/dev/vg0/lv0"},
    // None.
    {"", NO_PATH},
    {"\n", NO_PATH},
    {"  /dev/md1:vg1:lv1:\n  /dev/sda5:vg0:root:\n", NO_PATH},
    {"  /dev/MD2:vg1:lv1:\n", NO_PATH},
    // Rows that are cut short.
    {"  /dev/md2\n",
     NO_PATH,
     {{"<11>lvm.cpp:# Invalid pvs result [  /dev/md2\n]. separator ':' not found"}}},
    {"  /dev/md2",
     NO_PATH,
     {{"<11>lvm.cpp:# Invalid pvs result [  /dev/md2]. separator ':' not found"}}},
    {"  /dev/md2:vg1\n", NO_PATH, {{"<11>lvm.cpp:# pvg=vg1\n"}}},
    {"  /dev/md2:", NO_PATH, {{"<11>lvm.cpp:# pvg="}}},
    {"  /dev/md2:vg1:lv1\n", NO_PATH, {{"<11>lvm.cpp:# plv=lv1\n"}}},
    {"  /dev/md2:vg1:", NO_PATH, {{"<11>lvm.cpp:# plv="}}},
};

// The device's volume, in a buffer of so many bytes; what is behind them stays, and no stream is
// left open.
long long PathGet(const char *szExpected, int cbPath = 256)
{
    openlog(nullptr, LOG_NDELAY, LOG_USER); // so that the log takes no new descriptor
    const int nOpen = DescriptorsCount();
    char szPath[257] = "before";
    szPath[cbPath] = 'x';
    const int result = LVMGetLVPath("/dev/md2", szPath, cbPath);
    EXPECT_EQ(szPath[cbPath], 'x');
    EXPECT_STREQ(szPath, szExpected);
    EXPECT_EQ(DescriptorsCount(), nOpen);
    return result;
}

TEST(LVMGetLVPath, IsThatOfTheLastRowWithTheDevice)
{
    for (const ROW_CASE &row : ROW_CASES) {
        Expect(
            row.szRows, [&row] { return PathGet(row.szPath); }, Pvs(row.szRows) + row.told,
            MachineMake(), OLD_CODE, row.szPath == NO_PATH ? -1 : 0);
    }
}

// As many as 1023 characters, the last separator among them, and a longer row comes in pieces.
TEST(LVMGetLVPath, ARowMayFillTheWholeLine)
{
    const struct {
        size_t nBlank;
        const char *szPath;
        int result;
    } cases[] = {{1006, "/dev/vg1/lv1", 0}, {1019, NO_PATH, -1}, {1023, "/dev/vg1/lv1", 0}};
    for (const auto &row : cases) {
        Expect(
            "blanks before it", [&row] { return PathGet(row.szPath); },
            Pvs(std::string(row.nBlank, ' ') + "/dev/md2:vg1:lv1:origin\n"), MachineMake(),
            OLD_CODE, row.result);
    }
}

TEST(LVMGetLVPath, IsCutToTheBuffer)
{
    Expect("8 bytes", [] { return PathGet("/dev/vg", 8); }, Pvs(ROW_MD2));
}

TEST(LVMGetLVPath, BadArgumentsRunNothing)
{
    IdleCall(MachineMake(), [] {
        char szPath[256] = "before";
        EXPECT_QUIET(LVMGetLVPath(nullptr, szPath, sizeof(szPath)), -1);
        EXPECT_QUIET(LVMGetLVPath("/dev/md2", nullptr, sizeof(szPath)), -1);
        EXPECT_QUIET(LVMGetLVPath("/dev/md2", szPath, 0), -1);
        EXPECT_QUIET(LVMGetLVPath("/dev/md2", szPath, -1), -1);
        EXPECT_QUIET(LVMGetLVPath("/dev/md2", szPath, INT_MIN), -1);
        EXPECT_QUIET(LVMRmLVPath(nullptr), -1);
        EXPECT_STREQ(szPath, "before");
    });
}

TEST(LVMGetLVPath, WarningsAndTheStatusAreNotAsked)
{
    STEPS steps = Pvs(ROW_MD2);
    steps[0].answer.szErr = "  WARNING: /dev/md2:wrong:wrong: is missing\n";
    steps[0].answer.status = 5;
    const RUN_RESULT result = ExpectCall(
        {.szName = "a warning", .call = [] { return PathGet("/dev/vg1/lv1"); }, .steps = steps});
    EXPECT_EQ(OperationErrors(), "");
    ASSERT_EQ(result.events.size(), 1U);
    EXPECT_TRUE(result.events[0].fNullInput);
    EXPECT_TRUE(result.events[0].fNullError);
    EXPECT_EQ(result.events[0].nDescriptors, 0);
}

long long Remove()
{
    return LVMRmLVPath("/dev/md2");
}

TEST(LVMGetLVPath, ACommandThatCannotBeStartedIsTold)
{
    const MACHINE machine = WithFault(MachineMake(), {.szFunction = "pipe2", .error = EMFILE});
    const STEPS steps = {{"fault pipe2 1"},
                         {"<11>lvm.cpp:# Fail to do [/sbin/pvs -o "
                          "pv_name,vg_name,lv_name,origin --noheading --separator :]"}};
    Expect("no path", [] { return PathGet(NO_PATH); }, steps, machine, ERR_PIPE_FAILED, -1);
    Expect("as if there was none", Remove, steps, machine, ERR_PIPE_FAILED);
}

// ---- taking it down ----------------------------------------------------------------------------

TEST(LVMRmLVPath, WithoutAWholeRowNothingIsRun)
{
    Expect("no row", Remove, Pvs(""));
    Expect("another device", Remove, Pvs("  /dev/md1:vg1:lv1:\n  /dev/sdb5:vg0:root:\n"));
    Expect("a broken row", Remove, Pvs("  /dev/md2:vg1\n") + STEPS{{"<11>lvm.cpp:# pvg=vg1\n"}});
    Expect("no tool", Remove, {}, WithTool(MachineMake(), "/sbin/pvs", TOOL_KIND::MISSING));
    Expect("no mount table", Remove,
           Pvs(ROW_MD2) + STEPS{{"<11>lvm.cpp:# Failed to open /proc/mounts"}},
           Without(MachineMake(), "/proc/mounts"), OLD_CODE, -1);
}

TEST(LVMRmLVPath, RemovesVolumeGroupAndPhysicalVolume)
{
    Expect("a volume", Remove, Pvs(ROW_MD2) + LVM_REMOVED);
    Expect("free space, so the last row has no volume", Remove,
           Pvs("  /dev/md2:vg1:lv1:\n  /dev/md2:vg1::\n") +
               STEPS{{"/sbin/lvremove -f /dev/vg1/"}, VG_REMOVED, PV_REMOVED});
    Expect("a longer number is taken for the device", Remove,
           Pvs("  /dev/md20:vg20:lv20:\n") + STEPS{{"/sbin/lvremove -f /dev/vg20/lv20"},
                                                   {"/sbin/vgremove -f /dev/vg20"},
                                                   PV_REMOVED});
}

TEST(LVMRmLVPath, EveryFailureIsToldAndNoneEndsIt)
{
    MACHINE missing = MachineMake();
    STEPS told;
    for (const STEP &step : LVM_REMOVED) {
        missing.tools[step.szText.substr(0, step.szText.find(' '))] = TOOL_KIND::MISSING;
        told.push_back(RemoverFailed(step, {})[1]);
    }
    Expect("missing tools", Remove, Pvs(ROW_MD2) + told, missing);
    // What the runner could not even start it has on record itself.
    Expect("no pipe", Remove,
           Pvs(ROW_MD2) + STEPS{{"fault pipe2 2"}, {"fault pipe2 3"}, {"fault pipe2 4"}},
           WithFault(MachineMake(),
                     {.szFunction = "pipe2", .nCall = 2, .error = EMFILE, .fGoOn = true}),
           ERR_BAD_PARAMETER);
    Expect("each in its way", Remove,
           Pvs(ROW_MD2) + RemoversFailed({.szErr = "  in use\n", .status = 5}, {.status = 1},
                                         {.signal = SIGKILL}));
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
        const long long result = Remove();
        for (const std::string &szFolder : folders) {
            EXPECT_EQ(access(szFolder.c_str(), F_OK), szFolder == "/stays" ? 0 : -1) << szFolder;
        }
        return result;
    };
    Expect(szName, call, Pvs(ROW_MD2) + steps + LVM_REMOVED, machine);
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
    StepsExpect(machine, Pvs(ROW_MD2) + STEPS{{"/sbin/lvremove -f /dev/vg1/lv1s1"}} + LVM_REMOVED);
    QuietCall(machine, [] {
        EXPECT_EQ(Remove(), 0);
        EXPECT_EQ(access("/my volume", F_OK), -1);
    });
}

TEST(LVMRmLVPath, EmptyFieldsAreTakenAsTheyAre)
{
    MACHINE machine = WithFile(MachineMake(), "/proc/mounts", "/dev//s1 /volume1 ext4 rw 0 0\n");
    MachineFolder(machine, "/volume1");
    Expect("no group, no volume", Remove,
           Pvs("  /dev/md2:::\n") + Unmounted("/dev//s1", "/volume1") +
               STEPS{{"/sbin/lvremove -f /dev//"}, {"/sbin/vgremove -f /dev/"}, PV_REMOVED},
           machine);
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
        Expect("255 characters or more", Remove,
               Pvs("  /dev/md2:vg1:" + std::string(246, 'v') + szBehind + ":\n") +
                   Unmounted(szVolume + "s1", "/volume2") +
                   STEPS{{"/sbin/lvremove -f " + szVolume}, VG_REMOVED, PV_REMOVED},
               machine);
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
    Expect(szName, Remove, Pvs(ROW_MD2) + steps + LVM_REMOVED, machine, code);
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
    const RUN_RESULT result =
        ExpectCall({.szName = "a mount",
                    .machine = machine,
                    .call = Remove,
                    .steps = Pvs(ROW_MD2) + STEPS{UMOUNT, PAUSE, MOUNT_LV} + LVM_REMOVED});
    ASSERT_GE(result.events.size(), 2U);
    const RUN_EVENT &unmount = result.events[1];
    EXPECT_EQ(unmount.argv[0], "/bin/umount");
    EXPECT_TRUE(unmount.fNullInput && unmount.fNullOutput && unmount.fNullError);
    EXPECT_EQ(unmount.environment, std::vector<std::string>{"PATH=/sbin:/bin"});
}

} // namespace
