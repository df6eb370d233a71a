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

TEST(LVMGetLVPath, ARowThatIsTooLongComesInPieces)
{
    const std::string szLong(1023, ' ');
    MachineCall(MachineWithRows(szLong + "/dev/md2:vg1:lv1:\n"), [] {
        char szPath[256] = "";
        EXPECT_EQ(LVMGetLVPath("/dev/md2", szPath, sizeof(szPath)), 0);
        EXPECT_STREQ(szPath, "/dev/vg1/lv1");
    });
    MachineCall(MachineWithRows(szLong.substr(4) + "/dev/md2:vg1:lv1:\n"), [] {
        char szPath[256] = "";
        EXPECT_EQ(LVMGetLVPath("/dev/md2", szPath, sizeof(szPath)), -1);
    });
}

// As many as 1023 characters, the last separator among them.
TEST(LVMGetLVPath, ARowMayFillTheWholeLine)
{
    const std::string szRow = "/dev/md2:vg1:lv1:";
    MachineCall(MachineWithRows(std::string(1023 - szRow.size(), ' ') + szRow + "origin\n"), [] {
        char szPath[256] = "";
        EXPECT_EQ(LVMGetLVPath("/dev/md2", szPath, sizeof(szPath)), 0);
        EXPECT_STREQ(szPath, "/dev/vg1/lv1");
    });
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
    EXPECT_EQ(LogText(result), "");
    EXPECT_EQ(TranscriptText(result), "");
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
    EXPECT_EQ(MachineFileRead("/var/log/space_operation_error.log"), std::nullopt);
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

struct REMOVALS {
    TOOL_ANSWER volume = {};
    TOOL_ANSWER group = {};
    TOOL_ANSWER physical = {};
};

void RemovalsExpect(MACHINE &machine, const REMOVALS &removals = {})
{
    MachineTool(machine, "/sbin/lvremove -f /dev/vg1/lv1", removals.volume);
    MachineTool(machine, "/sbin/vgremove -f /dev/vg1", removals.group);
    MachineTool(machine, "/sbin/pvremove -f /dev/md2", removals.physical);
}

const std::vector<std::string> REMOVAL_COMMANDS = {
    "/sbin/lvremove -f /dev/vg1/lv1", "/sbin/vgremove -f /dev/vg1", "/sbin/pvremove -f /dev/md2"};

// The look-up, what is given, and the three removals.
std::string Transcript(std::vector<std::string> between)
{
    between.insert(between.begin(), PVS);
    between.insert(between.end(), REMOVAL_COMMANDS.begin(), REMOVAL_COMMANDS.end());
    return Lines(between);
}

RUN_RESULT Remove(const MACHINE &machine, int expected = 0)
{
    return MachineCall(machine, [expected] {
        RecordReset();
        EXPECT_EQ(LVMRmLVPath("/dev/md2"), expected);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
}

TEST(LVMRmLVPath, WithoutARowNothingIsRun)
{
    for (const char *const szRows :
         {"", "  /dev/md1:vg1:lv1:\n", "  /dev/sda5:vg0:root:\n  /dev/sdb5:vg0:root:\n"}) {
        const RUN_RESULT result = Remove(MachineWithRows(szRows));
        EXPECT_EQ(LogText(result), "");
        EXPECT_EQ(TranscriptText(result), std::string(PVS) + "\n");
    }
}

TEST(LVMRmLVPath, WithABrokenRowNothingIsRun)
{
    const RUN_RESULT result = Remove(MachineWithRows("  /dev/md2:vg1\n"));
    EXPECT_EQ(LogText(result), "<11>lvm.cpp:# pvg=vg1\n\n");
    EXPECT_EQ(TranscriptText(result), std::string(PVS) + "\n");
}

TEST(LVMRmLVPath, AMissingToolMeansNoLvm)
{
    MACHINE machine = MachineMake();
    machine.tools["/sbin/pvs"] = TOOL_KIND::MISSING;
    const RUN_RESULT result = Remove(machine);
    EXPECT_EQ(LogText(result), "");
    EXPECT_EQ(TranscriptText(result), "");
}

TEST(LVMRmLVPath, RemovesVolumeGroupAndPhysicalVolume)
{
    MACHINE machine = MachineWithRows(ROW_MD2);
    RemovalsExpect(machine);
    const RUN_RESULT result = Remove(machine);
    EXPECT_EQ(LogText(result), "");
    EXPECT_EQ(TranscriptText(result), Transcript({}));
}

TEST(LVMRmLVPath, AGroupWithFreeSpaceHasNoVolumeInItsLastRow)
{
    MACHINE machine = MachineWithRows("  /dev/md2:vg1:lv1:\n  /dev/md2:vg1::\n");
    MachineTool(machine, "/sbin/lvremove -f /dev/vg1/");
    MachineTool(machine, "/sbin/vgremove -f /dev/vg1");
    MachineTool(machine, "/sbin/pvremove -f /dev/md2");
    EXPECT_EQ(LogText(Remove(machine)), "");
}

TEST(LVMRmLVPath, EmptyFieldsAreTakenAsTheyAre)
{
    MACHINE machine = MachineWithRows("  /dev/md2:::\n");
    MachineFile(machine, "/proc/mounts", "/dev//s1 /volume1 ext4 rw 0 0\n");
    MachineTool(machine, "/bin/umount -R -A -k /volume1");
    MachineFolder(machine, "/volume1");
    MachineTool(machine, "/sbin/lvremove -f /dev//s1");
    MachineTool(machine, "/sbin/lvremove -f /dev//");
    MachineTool(machine, "/sbin/vgremove -f /dev/");
    MachineTool(machine, "/sbin/pvremove -f /dev/md2");
    const RUN_RESULT result = Remove(machine);
    EXPECT_EQ(LogText(result), "");
    EXPECT_EQ(TranscriptText(result),
              Lines({PVS, "/bin/umount -R -A -k /volume1", "sleep 1", "/sbin/lvremove -f /dev//s1",
                     "/sbin/lvremove -f /dev//", "/sbin/vgremove -f /dev/",
                     "/sbin/pvremove -f /dev/md2"}));
}

TEST(LVMRmLVPath, ALongerNumberIsTakenForTheDevice)
{
    MACHINE machine = MachineWithRows("  /dev/md20:vg20:lv20:\n");
    MachineTool(machine, "/sbin/lvremove -f /dev/vg20/lv20");
    MachineTool(machine, "/sbin/vgremove -f /dev/vg20");
    MachineTool(machine, "/sbin/pvremove -f /dev/md2");
    EXPECT_EQ(LogText(Remove(machine)), "");
}

TEST(LVMRmLVPath, EveryFailureIsToldAndNoneEndsIt)
{
    MACHINE machine = MachineWithRows(ROW_MD2);
    RemovalsExpect(machine, {{.szErr = "  in use\n", .status = 5}, {.status = 1}, {.signal = 9}});
    const RUN_RESULT result = Remove(machine);
    EXPECT_EQ(LogText(result), "<11>lvm.cpp:# Failed to /sbin/lvremove -f /dev/vg1/lv1\n"
                               "<11>lvm.cpp:# Failed to /sbin/vgremove -f /dev/vg1\n"
                               "<11>lvm.cpp:# Failed to /sbin/pvremove -f /dev/md2\n");
    EXPECT_EQ(TranscriptText(result), Transcript({}));
    EXPECT_EQ(OperationErrors(),
              "<time> command=\"/sbin/lvremove -f /dev/vg1/lv1\" Error=\"  in use \"\n");
}

TEST(LVMRmLVPath, MissingToolsAreFailures)
{
    MACHINE machine = MachineWithRows(ROW_MD2);
    for (const char *const szTool : {"/sbin/lvremove", "/sbin/vgremove", "/sbin/pvremove"}) {
        machine.tools[szTool] = TOOL_KIND::MISSING;
    }
    const RUN_RESULT result = Remove(machine);
    EXPECT_EQ(LogText(result), "<11>lvm.cpp:# Failed to /sbin/lvremove -f /dev/vg1/lv1\n"
                               "<11>lvm.cpp:# Failed to /sbin/vgremove -f /dev/vg1\n"
                               "<11>lvm.cpp:# Failed to /sbin/pvremove -f /dev/md2\n");
}

// What the runner could not even start it has on record itself.
TEST(LVMRmLVPath, AResultOfMinusOneIsNotTold)
{
    MACHINE machine = MachineWithRows(ROW_MD2);
    machine.faults = {{.szFunction = "pipe2", .nCall = 2, .error = EMFILE, .fGoOn = true}};
    const RUN_RESULT result = MachineCall(machine, [] { EXPECT_EQ(LVMRmLVPath("/dev/md2"), 0); });
    EXPECT_EQ(LogText(result), "");
    EXPECT_EQ(TranscriptText(result),
              Lines({PVS, "fault pipe2 2", "fault pipe2 3", "fault pipe2 4"}));
}

TEST(LVMRmLVPath, WithoutAMountTableNothingIsRemoved)
{
    MACHINE machine = MachineWithRows(ROW_MD2);
    MachineRemove(machine, "/proc/mounts");
    const RUN_RESULT result = Remove(machine, -1);
    EXPECT_EQ(LogText(result), "<11>lvm.cpp:# Failed to open /proc/mounts\n");
    EXPECT_EQ(TranscriptText(result), std::string(PVS) + "\n");
}

// ---- mounts ------------------------------------------------------------------------------------

MACHINE MachineWithMounts(const std::string &szMounts)
{
    MACHINE machine = MachineWithRows(ROW_MD2);
    MachineFile(machine, "/proc/mounts", szMounts);
    RemovalsExpect(machine);
    return machine;
}

TEST(LVMRmLVPath, UnmountsInTheOrderOfTheTable)
{
    MACHINE machine = MachineWithMounts("rootfs / rootfs rw 0 0\n"
                                        "/dev/vg1/lv1s2 /volume2 ext4 rw 0 0\n"
                                        "/dev/sda1 /boot ext4 rw 0 0\n"
                                        "/dev/vg1/lv1s1 /volume1 xfs rw 0 0\n");
    MachineFolder(machine, "/volume1");
    MachineFolder(machine, "/volume2");
    for (const char *const szCommand :
         {"/bin/umount -R -A -k /volume2", "/sbin/lvremove -f /dev/vg1/lv1s2",
          "/bin/umount -R -A -k /volume1", "/sbin/lvremove -f /dev/vg1/lv1s1"}) {
        MachineTool(machine, szCommand);
    }
    const RUN_RESULT result = MachineCall(machine, [] {
        EXPECT_EQ(LVMRmLVPath("/dev/md2"), 0);
        EXPECT_EQ(access("/volume1", F_OK), -1);
        EXPECT_EQ(access("/volume2", F_OK), -1);
    });
    EXPECT_EQ(LogText(result), "");
    EXPECT_EQ(TranscriptText(result),
              Transcript({"/bin/umount -R -A -k /volume2", "sleep 1",
                          "/sbin/lvremove -f /dev/vg1/lv1s2", "/bin/umount -R -A -k /volume1",
                          "sleep 1", "/sbin/lvremove -f /dev/vg1/lv1s1"}));
}

TEST(LVMRmLVPath, MountsOfOtherDevicesAreLeftAlone)
{
    const RUN_RESULT result = Remove(MachineWithMounts("/dev/vg1/lv1 /volume1 ext4 rw 0 0\n"
                                                       "/dev/vg1/lv10 /volume2 ext4 rw 0 0\n"
                                                       "/dev/vg1/lv1-s1 /volume3 ext4 rw 0 0\n"
                                                       "/dev/vg1/lv1S1 /volume4 ext4 rw 0 0\n"
                                                       "/dev/vg1 /volume5 ext4 rw 0 0\n"
                                                       "x/dev/vg1/lv1s1 /volume6 ext4 rw 0 0\n"
                                                       "tmpfs /dev/vg1/lv1s1 tmpfs rw 0 0\n"));
    EXPECT_EQ(LogText(result), "");
    EXPECT_EQ(TranscriptText(result), Transcript({}));
}

TEST(LVMRmLVPath, AufsMountsAreLeftAlone)
{
    MACHINE machine = MachineWithMounts("/dev/vg1/lv1s1 /union aufs rw 0 0\n"
                                        "/dev/vg1/lv1s1 /volume1 aufs2 rw 0 0\n"
                                        "/dev/vg1/lv1s /volume2 AUFS rw 0 0\n");
    MachineFolder(machine, "/union");
    MachineFolder(machine, "/volume1");
    MachineFolder(machine, "/volume2");
    MachineTool(machine, "/bin/umount -R -A -k /volume1");
    MachineTool(machine, "/sbin/lvremove -f /dev/vg1/lv1s1");
    MachineTool(machine, "/bin/umount -R -A -k /volume2");
    MachineTool(machine, "/sbin/lvremove -f /dev/vg1/lv1s");
    const RUN_RESULT result = MachineCall(machine, [] {
        EXPECT_EQ(LVMRmLVPath("/dev/md2"), 0);
        EXPECT_EQ(access("/union", F_OK), 0);
        EXPECT_EQ(access("/volume1", F_OK), -1);
        EXPECT_EQ(access("/volume2", F_OK), -1);
    });
    EXPECT_EQ(LogText(result), "");
}

TEST(LVMRmLVPath, EscapesOfTheTableAreRead)
{
    MACHINE machine = MachineWithMounts("/dev/vg1/lv1s1 /my\\040volume ext4 rw 0 0\n");
    MachineFolder(machine, "/my volume");
    MachineTool(machine, {"/bin/umount", "-R", "-A", "-k", "/my volume"});
    MachineTool(machine, "/sbin/lvremove -f /dev/vg1/lv1s1");
    const RUN_RESULT result = MachineCall(machine, [] {
        EXPECT_EQ(LVMRmLVPath("/dev/md2"), 0);
        EXPECT_EQ(access("/my volume", F_OK), -1);
    });
    EXPECT_EQ(LogText(result), "");
}

// Of a longer path the first 255 characters are the volume, and the "s" comes behind them.
TEST(LVMRmLVPath, AVolumePathIsCutTo255Characters)
{
    const std::string szVolume = "/dev/vg1/" + std::string(246, 'v');
    ASSERT_EQ(szVolume.size(), 255U);
    for (const char *const szBehind : {"", "w"}) {
        SCOPED_TRACE(szBehind);
        MACHINE machine =
            MachineWithRows("  /dev/md2:vg1:" + std::string(246, 'v') + szBehind + ":\n");
        MachineFile(machine, "/proc/mounts",
                    szVolume + "1 /volume1 ext4 rw 0 0\n" + szVolume + "s1 /volume2 ext4 rw 0 0\n");
        MachineFolder(machine, "/volume2");
        const std::vector<std::string> commands = {
            "/bin/umount -R -A -k /volume2", "/sbin/lvremove -f " + szVolume + "s1",
            "/sbin/lvremove -f " + szVolume, "/sbin/vgremove -f /dev/vg1",
            "/sbin/pvremove -f /dev/md2"};
        for (const std::string &szCommand : commands) {
            MachineTool(machine, szCommand);
        }
        EXPECT_EQ(LogText(Remove(machine)), "");
    }
}

// Of a longer entry the first 4095 characters are read: a type that ends behind them is another.
TEST(LVMRmLVPath, AMountEntryIsCutTo4095Characters)
{
    const std::string szStart = "/dev/vg1/lv1s1 /volume1";
    const std::string szBlanks(4095 - szStart.size() - 4, ' ');
    const RUN_RESULT whole = Remove(MachineWithMounts(szStart + szBlanks +
                                                      "aufs rw 0 0\n"
                                                      "tmpfs /tmp tmpfs rw 0 0\n"));
    EXPECT_EQ(TranscriptText(whole), Transcript({}));

    MACHINE machine = MachineWithMounts(szStart + szBlanks + " aufs rw 0 0\n");
    MachineFolder(machine, "/volume1");
    MachineTool(machine, "/bin/umount -R -A -k /volume1");
    MachineTool(machine, "/sbin/lvremove -f /dev/vg1/lv1s1");
    EXPECT_EQ(LogText(Remove(machine)), "");
}

// A mounted volume /volume1 whose folder can go, with this answer of umount and of the removal.
MACHINE MachineWithMount(const TOOL_ANSWER &unmount, const TOOL_ANSWER &removal)
{
    MACHINE machine = MachineWithMounts("/dev/vg1/lv1s1 /volume1 ext4 rw 0 0\n");
    MachineFolder(machine, "/volume1");
    MachineTool(machine, "/bin/umount -R -A -k /volume1", unmount);
    MachineTool(machine, "/sbin/lvremove -f /dev/vg1/lv1s1", removal);
    return machine;
}

const std::vector<std::string> MOUNT_STEPS = {"/bin/umount -R -A -k /volume1", "sleep 1",
                                              "/sbin/lvremove -f /dev/vg1/lv1s1"};

TEST(LVMRmLVPath, AFailedUnmountIsToldInTheOldWords)
{
    const RUN_RESULT result =
        Remove(MachineWithMount({.szErr = "umount: busy\n", .status = 32}, {}));
    EXPECT_EQ(LogText(result), "<11>lvm.cpp:# Failed to /bin/umount -f -k /volume1\n");
    EXPECT_EQ(TranscriptText(result), Transcript(MOUNT_STEPS));
    // umount does not go through the runner that keeps the operation errors.
    EXPECT_EQ(MachineFileRead("/var/log/space_operation_error.log"), std::nullopt);
}

TEST(LVMRmLVPath, AMissingUnmountIsAFailure)
{
    MACHINE machine = MachineWithMount({.nTimes = 0}, {});
    machine.tools["/bin/umount"] = TOOL_KIND::MISSING;
    EXPECT_EQ(LogText(Remove(machine)), "<11>lvm.cpp:# Failed to /bin/umount -f -k /volume1\n");
}

TEST(LVMRmLVPath, AnUnmountThatIsKilledIsNotTold)
{
    const RUN_RESULT result = MachineCall(MachineWithMount({.signal = SIGKILL}, {}), [] {
        EXPECT_EQ(LVMRmLVPath("/dev/md2"), 0);
        EXPECT_EQ(NLIBCErrGet(), ERR_CHILD_FAILED);
    });
    EXPECT_EQ(LogText(result), "");
    EXPECT_EQ(TranscriptText(result), Transcript(MOUNT_STEPS));
}

TEST(LVMRmLVPath, TheUnmountHasNoStreamsAndOnlyThePath)
{
    MACHINE machine = MachineWithMount({}, {});
    machine.environment["SECRET"] = "1";
    const RUN_RESULT result = Remove(machine);
    ASSERT_GE(result.events.size(), 2U);
    const RUN_EVENT &unmount = result.events[1];
    EXPECT_EQ(unmount.argv[0], "/bin/umount");
    EXPECT_TRUE(unmount.fNullInput && unmount.fNullOutput && unmount.fNullError);
    EXPECT_EQ(unmount.environment, std::vector<std::string>{"PATH=/sbin:/bin"});
}

TEST(LVMRmLVPath, AFolderThatStaysIsTold)
{
    MACHINE machine = MachineWithMount({}, {});
    MachineFile(machine, "/volume1/file", "");
    const RUN_RESULT result = Remove(machine);
    EXPECT_EQ(LogText(result), "<11>lvm.cpp:# Failed to rmdir(/volume1)\n");
    EXPECT_EQ(TranscriptText(result), Transcript(MOUNT_STEPS));
    EXPECT_EQ(MachineFileRead("/volume1/file"), "");
}

// The mount has a second to go before its folder is taken away.
TEST(LVMRmLVPath, TheFolderIsRemovedBehindThePause)
{
    MACHINE machine = MachineWithMount({}, {});
    machine.faults = {{.szFunction = "rmdir", .error = EBUSY}};
    const RUN_RESULT result = Remove(machine);
    EXPECT_EQ(LogText(result), "<11>lvm.cpp:# Failed to rmdir(/volume1)\n");
    EXPECT_EQ(TranscriptText(result),
              Transcript({"/bin/umount -R -A -k /volume1", "sleep 1", "fault rmdir 1",
                          "/sbin/lvremove -f /dev/vg1/lv1s1"}));
}

TEST(LVMRmLVPath, AFolderThatIsGoneIsTold)
{
    const RUN_RESULT result = Remove(MachineWithMount({.removes = {"/volume1"}}, {}));
    EXPECT_EQ(LogText(result), "<11>lvm.cpp:# Failed to rmdir(/volume1)\n");
    EXPECT_EQ(TranscriptText(result), Transcript(MOUNT_STEPS));
}

TEST(LVMRmLVPath, EveryFailureOfAMountIsToldAndNoneEndsIt)
{
    MACHINE machine = MachineWithMount({.status = 1}, {.szErr = "  busy\n", .status = 5});
    MachineFile(machine, "/volume1/file", "");
    const RUN_RESULT result = Remove(machine);
    EXPECT_EQ(LogText(result), "<11>lvm.cpp:# Failed to /bin/umount -f -k /volume1\n"
                               "<11>lvm.cpp:# Failed to rmdir(/volume1)\n"
                               "<11>lvm.cpp:# Failed to /sbin/lvremove -f /dev/vg1/lv1s1\n");
    EXPECT_EQ(TranscriptText(result), Transcript(MOUNT_STEPS));
    EXPECT_EQ(OperationErrors(),
              "<time> command=\"/sbin/lvremove -f /dev/vg1/lv1s1\" Error=\"  busy \"\n");
}

TEST(LVMRmLVPath, AKilledRemovalOfAMountIsTold)
{
    const RUN_RESULT result = Remove(MachineWithMount({}, {.signal = SIGKILL}));
    EXPECT_EQ(LogText(result), "<11>lvm.cpp:# Failed to /sbin/lvremove -f /dev/vg1/lv1s1\n");
}

} // namespace
