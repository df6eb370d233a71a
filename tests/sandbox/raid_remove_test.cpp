// SPDX-License-Identifier: MIT
#include "nurostoragecore/raid_remove.h"

#include "removal_machine.h"

#include <cerrno>
#include <climits>
#include <csignal>
#include <cstring>
#include <gtest/gtest.h>
#include <string>
#include <vector>

namespace
{

constexpr int MANY_COMMANDS_MS = 60000; // fifty of them, on a machine that may be shared

constexpr char STOP_MD2[] = "/sbin/mdadm -S /dev/md2";
constexpr char STOP_TOLD[] = "<11>raid_remove.cpp:# Failed to mdadm stop '/dev/md2'\n"
                             "<11>raid_remove.cpp:# Fail to stop [/dev/md2], try again\n";
constexpr char LIMIT_TOLD[] = "<11>raid_remove.cpp:# Reach RAID stop retry limit\n";
constexpr char CLEAN_TOLD[] = "<11>raid_remove.cpp:# [Info] clean RAID superblock of /dev/md2\n";

std::string WipedTold(const std::string &szName)
{
    return "<11>raid_remove.cpp:# [Info] Clean RAID superblock on '/dev/" + szName + "'\n";
}

std::string WipeFailedTold(const std::string &szName)
{
    return "<11>raid_remove.cpp:# Failed to zero RAID superblock '/dev/" + szName +
           "'\n"
           "<11>raid_remove.cpp:# Failed to clean suerblock of '/dev/" +
           szName + "'\n";
}

// A map as a caller makes it, in the order of the pairs.
PNLIBHASH MapOf(const std::vector<std::pair<std::string, std::string>> &pairs)
{
    PNLIBHASH pMap = NLIBCHashAlloc(512);
    for (const auto &[szKey, szValue] : pairs) {
        EXPECT_GE(NLIBCHashSet(&pMap, szKey.c_str(), szValue.c_str()), 0);
    }
    return pMap;
}

std::string KeysOf(const NLIBHASH *pMap)
{
    PNLIBSZLIST pKeys = NLIBCSzListAlloc(512);
    const int nKey = NLIBCHashKeyListGet(pMap, &pKeys);
    std::string szText;
    for (int i = 0; i < nKey; i++) {
        szText += std::string(NLIBCSzListGet(pKeys, i)) + "\n";
    }
    NLIBCSzListFree(pKeys);
    return szText;
}

// ---- one command -------------------------------------------------------------------------------

struct STEP_CASE {
    TOOL_ANSWER answer;
    int result;
};

const STEP_CASE STEP_CASES[] = {
    {{}, 0},
    {{.szErr = "mdadm: stopped\n"}, 0}, // only the status counts
    {{.status = 1}, -1},
    {{.szErr = "mdadm: busy\n", .status = 255}, -1},
    {{.signal = SIGKILL}, -1},
};

TEST(RAIDStop, IsOneCommand)
{
    for (const STEP_CASE &row : STEP_CASES) {
        MACHINE machine = MachineMake();
        MachineTool(machine, STOP_MD2, row.answer);
        const RUN_RESULT result = MachineCall(machine, [&row] {
            RecordReset();
            EXPECT_EQ(RAIDStop("/dev/md2"), row.result);
            EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
        });
        EXPECT_EQ(LogText(result),
                  row.result == 0 ? "" : "<11>raid_remove.cpp:# Failed to mdadm stop '/dev/md2'\n");
    }
}

TEST(RAIDZeroSuperblock, IsOneCommand)
{
    for (const STEP_CASE &row : STEP_CASES) {
        MACHINE machine = MachineMake();
        MachineTool(machine, WipeCommand("sda3"), row.answer);
        const RUN_RESULT result = MachineCall(machine, [&row] {
            RecordReset();
            EXPECT_EQ(RAIDZeroSuperblock("/dev/sda3"), row.result);
            EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
        });
        EXPECT_EQ(LogText(result),
                  row.result == 0
                      ? ""
                      : "<11>raid_remove.cpp:# Failed to zero RAID superblock '/dev/sda3'\n");
    }
}

TEST(RAIDStop, FailsWithTheCodeOfTheRunner)
{
    MACHINE machine = MachineMake();
    machine.faults = {{.szFunction = "pipe2", .error = EMFILE}};
    const RUN_RESULT result = MachineCall(machine, [] {
        EXPECT_EQ(RAIDStop("/dev/md2"), -1);
        EXPECT_EQ(NLIBCErrGet(), ERR_BAD_PARAMETER); // of the stream that is not there
    });
    EXPECT_EQ(LogText(result), "<11>raid_remove.cpp:# Failed to mdadm stop '/dev/md2'\n");
    EXPECT_EQ(TranscriptText(result), "fault pipe2 1\n");
}

TEST(RAIDStop, AMissingToolFails)
{
    MACHINE machine = MachineMake();
    machine.tools["/sbin/mdadm"] = TOOL_KIND::MISSING;
    const RUN_RESULT result = MachineCall(machine, [] {
        EXPECT_EQ(RAIDStop("/dev/md2"), -1);
        EXPECT_EQ(RAIDZeroSuperblock("/dev/sda3"), -1);
    });
    EXPECT_EQ(LogText(result),
              "<11>raid_remove.cpp:# Failed to mdadm stop '/dev/md2'\n"
              "<11>raid_remove.cpp:# Failed to zero RAID superblock '/dev/sda3'\n");
}

TEST(RAIDRemove, BadArgumentsAreToldAndRunNothing)
{
    const RUN_RESULT result = MachineCall(MachineWithMirror(), [] {
        const RAID_INFO info = RecordOf("/dev/md2");
        RecordReset();
        EXPECT_EQ(RAIDRemoveByInfo(nullptr), -1);
        EXPECT_EQ(RAIDRemove(nullptr, nullptr), -1);
        EXPECT_EQ(RAIDStop(nullptr), -1);
        EXPECT_EQ(RAIDZeroSuperblock(nullptr), -1);
        EXPECT_EQ(RAIDCleanSuperblock(nullptr, "uuid", nullptr), -1);
        EXPECT_EQ(RAIDCleanSuperblock(&info, nullptr, nullptr), -1);
        EXPECT_EQ(RAIDUUIDHashForRemoveGet(nullptr), -1);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
    std::string szExpected;
    for (int i = 0; i < 7; i++) {
        szExpected += "<11>raid_remove.cpp:# Bad parameters\n";
    }
    EXPECT_EQ(LogText(result), szExpected);
    EXPECT_EQ(TranscriptText(result), "");
}

// ---- the UUID of a running array ---------------------------------------------------------------

TEST(RAIDUUIDGet, IsThatOfTheMemberThatSortsLast)
{
    MACHINE machine = MachineWithMirror();
    ExamineExpect(machine, "sdb3", UUID_MD2);
    const RUN_RESULT result = MachineCall(machine, [] {
        char szUuid[64] = "";
        EXPECT_EQ(RAIDUUIDGet("/dev/md2", szUuid, sizeof(szUuid)), 1);
        EXPECT_STREQ(szUuid, UUID_MD2);
    });
    EXPECT_EQ(LogText(result), "");
    EXPECT_EQ(TranscriptText(result), "/sbin/mdadm -E /dev/sdb3\n");
}

TEST(RAIDUUIDGet, IsCutToTheBuffer)
{
    MACHINE machine = MachineWithMirror();
    ExamineExpect(machine, "sdb3", UUID_MD2, 2);
    MachineCall(machine, [] {
        char szUuid[8] = "xxxxxxx";
        EXPECT_EQ(RAIDUUIDGet("/dev/md2", szUuid, 5), 1);
        EXPECT_STREQ(szUuid, "5b1f");
        EXPECT_EQ(szUuid[5], 'x');
        EXPECT_EQ(RAIDUUIDGet("/dev/md2", szUuid, 1), 1);
        EXPECT_STREQ(szUuid, "");
    });
}

TEST(RAIDUUIDGet, BadArgumentsSetACodeAndRunNothing)
{
    const RUN_RESULT result = MachineCall(MachineWithMirror(), [] {
        char szUuid[64] = "before";
        const auto refused = [&szUuid](const char *szMd, char *szBuf, int cbBuf) {
            RecordReset();
            EXPECT_EQ(RAIDUUIDGet(szMd, szBuf, cbBuf), -1);
            EXPECT_EQ(NLIBCErrGet(), ERR_BAD_PARAMETER);
            EXPECT_STREQ(szUuid, "before");
        };
        refused(nullptr, szUuid, sizeof(szUuid));
        refused("/dev/md2", nullptr, sizeof(szUuid));
        refused("/dev/md2", szUuid, 0);
        refused("/dev/md2", szUuid, -1);
        refused("/dev/md2", szUuid, INT_MIN);
    });
    EXPECT_EQ(LogText(result), "");
    EXPECT_EQ(TranscriptText(result), "");
}

TEST(RAIDUUIDGet, AnArrayThatCannotBeAskedFails)
{
    const RUN_RESULT result = MachineCall(MachineMake(), [] {
        char szUuid[64] = "before";
        EXPECT_EQ(RAIDUUIDGet("/dev/md2", szUuid, sizeof(szUuid)), -1);
        EXPECT_EQ(NLIBCErrGet(), ERR_OPEN_FAILED);
        EXPECT_STREQ(szUuid, "before");
    });
    EXPECT_EQ(LogText(result),
              "<15>raid_info.cpp:# Failed to open /dev/md2, errno=No such file or directory\n"
              "<11>raid_remove.cpp:# Failed to get RAID info [/dev/md2], ret = -1\n");
}

// The driver's "no such device" ends up as a plain failure.
TEST(RAIDUUIDGet, AnArrayThatDoesNotRunFails)
{
    MACHINE machine = MachineWithMirror();
    machine.arrays[0].errnoInfo = ENODEV;
    const RUN_RESULT result = MachineCall(machine, [] {
        char szUuid[64] = "before";
        EXPECT_EQ(RAIDUUIDGet("/dev/md2", szUuid, sizeof(szUuid)), -1);
        EXPECT_EQ(NLIBCErrGet(), ERR_SYSCALL_FAILED);
    });
    EXPECT_EQ(LogText(result),
              "<15>raid_info.cpp:# Failed to ioctl for raid status, errno=No such device\n"
              "<15>raid_info.cpp:# Failed to ioctl for raid status, errno=0X8000\n"
              "<11>raid_remove.cpp:# Failed to get RAID info [/dev/md2], ret = -1\n");
}

TEST(RAIDUUIDGet, AnArrayWithoutMembersFails)
{
    MACHINE machine = MachineMake();
    MachineMdAdd(machine, {.nMd = 2});
    const RUN_RESULT result = MachineCall(machine, [] {
        char szUuid[64] = "before";
        EXPECT_EQ(RAIDUUIDGet("/dev/md2", szUuid, sizeof(szUuid)), -1);
        EXPECT_EQ(NLIBCErrGet(), ERR_NO_MEMBER_DISK);
        EXPECT_STREQ(szUuid, "before");
    });
    EXPECT_EQ(LogText(result), "");
    EXPECT_EQ(TranscriptText(result), "");
}

TEST(RAIDUUIDGet, AMemberWithoutASuperblockFails)
{
    MACHINE machine = MachineWithMirror();
    BlankMemberExpect(machine, "sdb3");
    MachineTool(machine, ExamineCommand("sdb3"), {.szOut = "Version : none\n"});
    const RUN_RESULT result = MachineCall(machine, [] {
        char szUuid[64] = "before";
        RecordReset();
        EXPECT_EQ(RAIDUUIDGet("/dev/md2", szUuid, sizeof(szUuid)), -1);
        EXPECT_EQ(RAIDUUIDGet("/dev/md2", szUuid, sizeof(szUuid)), -1);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
        EXPECT_STREQ(szUuid, "before");
    });
    EXPECT_EQ(LogText(result),
              "<11>raid_remove.cpp:# Disk [/dev/sdb3] in RAID [/dev/md2] has no RAID superblock, "
              "ret=0\n"
              "<11>raid_superblock.cpp:# bad version format: 'none'.\n"
              "<11>raid_remove.cpp:# Disk [/dev/sdb3] in RAID [/dev/md2] has no RAID superblock, "
              "ret=-1\n");
}

// ---- the map -----------------------------------------------------------------------------------

TEST(RAIDUUIDHashForRemoveGet, ExaminesDataPartitionsOfSdDisksInByteOrder)
{
    MACHINE machine = MachineMake();
    for (const char *const szDisk : {"sdb", "sda", "isdc", "nvme0n1", "mmcblk0", "vda", "xvda"}) {
        DiskWithPartitionsAdd(machine, szDisk, 4);
    }
    MachinePartitionAdd(machine, "sda", 10, 9000000, 2048);
    MachinePartitionAdd(machine, "sda", 20, 9900000, 2048);
    MachineMdAdd(machine, {.nMd = 2});
    const std::vector<std::string> examined = {"isdc3", "isdc4", "sda10", "sda20",
                                               "sda3",  "sda4",  "sdb3",  "sdb4"};
    std::string szExpected;
    for (const std::string &szName : examined) {
        ExamineExpect(machine, szName, "uuid of " + szName);
        szExpected += ExamineCommand(szName) + "\n";
    }
    const RUN_RESULT result = MachineCall(machine, [&examined] {
        PNLIBHASH pMap = NLIBCHashAlloc(512);
        EXPECT_EQ(RAIDUUIDHashForRemoveGet(&pMap), 0);
        EXPECT_EQ(NLIBCHashKeyListGet(pMap, nullptr), 8);
        for (const std::string &szName : examined) {
            EXPECT_EQ(std::string(NLIBCHashGet(pMap, ("/dev/" + szName).c_str())),
                      "uuid of " + szName);
        }
        NLIBCHashFree(pMap);
    });
    EXPECT_EQ(TranscriptText(result), szExpected);
    EXPECT_EQ(LogText(result), "");
}

TEST(RAIDUUIDHashForRemoveGet, LeavesOutWhatHasNoSuperblock)
{
    MACHINE machine = MachineMake();
    DiskWithPartitionsAdd(machine, "sda", 6);
    BlankMemberExpect(machine, "sda3");
    MachineTool(machine, ExamineCommand("sda4"),
                {.szOut = "UUID : half read\nDevice Role : Journal\nUUID : never\n"});
    MachineTool(machine, ExamineCommand("sda5"), {.szOut = "   MBR Magic : aa55\n"});
    ExamineExpect(machine, "sda6", UUID_MD2);
    const RUN_RESULT result = MachineCall(machine, [] {
        PNLIBHASH pMap = NLIBCHashAlloc(512);
        EXPECT_EQ(RAIDUUIDHashForRemoveGet(&pMap), 0);
        EXPECT_EQ(KeysOf(pMap), "/dev/sda6\n/dev/sda5\n"); // slots 2 and 17
        EXPECT_STREQ(NLIBCHashGet(pMap, "/dev/sda5"), ""); // a report, and no UUID in it
        EXPECT_STREQ(NLIBCHashGet(pMap, "/dev/sda6"), UUID_MD2);
        NLIBCHashFree(pMap);
    });
    EXPECT_EQ(LogText(result), "<11>raid_superblock.cpp:# bad device order format: 'Journal'.\n");
}

TEST(RAIDUUIDHashForRemoveGet, AddsToTheMapAndFollowsIt)
{
    MACHINE machine = MachineMake();
    machine.msBound = MANY_COMMANDS_MS;
    for (const char *const szDisk : {"sda", "sdb", "sdc", "sdd", "sde"}) {
        DiskWithPartitionsAdd(machine, szDisk, 8);
    }
    MachineTool(machine, "/sbin/mdadm -E *", {.szOut = ReportOf(UUID_MD2), .nTimes = 30});
    MachineCall(machine, [] {
        PNLIBHASH pMap = MapOf({{"/dev/sda3", "old"}, {"/dev/sdz3", "kept"}});
        EXPECT_EQ(RAIDUUIDHashForRemoveGet(&pMap), 0);
        EXPECT_EQ(pMap->nSlot, 119); // more than three quarters of 31 slots
        EXPECT_EQ(pMap->nEntry, 31);
        EXPECT_STREQ(NLIBCHashGet(pMap, "/dev/sda3"), UUID_MD2);
        EXPECT_STREQ(NLIBCHashGet(pMap, "/dev/sde8"), UUID_MD2);
        EXPECT_STREQ(NLIBCHashGet(pMap, "/dev/sdz3"), "kept");
        NLIBCHashFree(pMap);
    });
}

TEST(RAIDUUIDHashForRemoveGet, AMapThatRefusesAPairIsNoFailure)
{
    MACHINE machine = MachineWithMirror();
    ExamineExpect(machine, "sda3", UUID_MD2);
    ExamineExpect(machine, "sdb3", UUID_MD2);
    const RUN_RESULT result = MachineCall(machine, [] {
        PNLIBHASH pMap = nullptr;
        EXPECT_EQ(RAIDUUIDHashForRemoveGet(&pMap), 0);
        EXPECT_EQ(pMap, nullptr);
    });
    EXPECT_EQ(LogText(result), "");
}

TEST(RAIDUUIDHashForRemoveGet, FailsWithoutTheKernelsList)
{
    MACHINE machine = MachineMake();
    MachineRemove(machine, "/proc/partitions");
    const RUN_RESULT result = MachineCall(machine, [] {
        PNLIBHASH pMap = NLIBCHashAlloc(512);
        EXPECT_EQ(RAIDUUIDHashForRemoveGet(&pMap), -1);
        EXPECT_EQ(NLIBCErrGet(), ERR_OPEN_FAILED);
        EXPECT_EQ(pMap->nEntry, 0);
        NLIBCHashFree(pMap);
    });
    EXPECT_EQ(LogText(result),
              "<11>partition_enum.cpp:# Failed to read line of /proc/partitions, errno=0x900\n"
              "<11>raid_remove.cpp:# Fail to enum partition path\n");
}

TEST(RAIDUUIDHashForRemoveGet, AMachineWithoutPartitionsIsNoFailure)
{
    MACHINE machine = MachineMake();
    MachineFile(machine, "/proc/partitions", "\n");
    const RUN_RESULT result = MachineCall(machine, [] {
        PNLIBHASH pMap = NLIBCHashAlloc(512);
        EXPECT_EQ(RAIDUUIDHashForRemoveGet(&pMap), 0);
        EXPECT_EQ(pMap->nEntry, 0);
        NLIBCHashFree(pMap);
    });
    EXPECT_EQ(LogText(result), "");
}

TEST(RAIDUUIDHashForRemoveGet, FailsWithoutMemoryForItsList)
{
    MACHINE machine = MachineWithMirror();
    machine.faults = {{.szFunction = "malloc"}};
    PNLIBHASH pMap = NLIBCHashAlloc(512);
    const RUN_RESULT result = MachineCall(machine, [&pMap] {
        EXPECT_EQ(RAIDUUIDHashForRemoveGet(&pMap), -1);
        EXPECT_EQ(NLIBCErrGet(), ERR_OUT_OF_MEMORY);
    });
    NLIBCHashFree(pMap);
    EXPECT_EQ(LogText(result), "<11>raid_remove.cpp:# Fail to alloc RAID UUID list\n");
    EXPECT_EQ(TranscriptText(result), "fault malloc 1\n");
}

// ---- cleaning ----------------------------------------------------------------------------------

// The home slots of sda3, sdb3, ... sdp3 are 16, 17, ... 31, and the last is slot 0 of 31.
TEST(RAIDCleanSuperblock, WipesInTheOrderOfTheMap)
{
    MACHINE machine = MachineMake();
    for (const char *const szDisk : {"sda", "sdb", "sdo", "sdp", "sdq"}) {
        DiskWithPartitionsAdd(machine, szDisk, 3);
        ExamineExpect(machine, std::string(szDisk) + "3", UUID_MD2);
        MachineTool(machine, WipeCommand(std::string(szDisk) + "3"));
    }
    const RUN_RESULT result = MachineCall(machine, [] {
        const RAID_INFO info = {};
        RecordReset();
        EXPECT_EQ(RAIDCleanSuperblock(&info, UUID_MD2, nullptr), 0);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
    EXPECT_EQ(
        TranscriptText(result),
        Lines({"/sbin/mdadm -E /dev/sda3", "/sbin/mdadm -E /dev/sdb3", "/sbin/mdadm -E /dev/sdo3",
               "/sbin/mdadm -E /dev/sdp3", "/sbin/mdadm -E /dev/sdq3",
               "/sbin/mdadm --zero-superblock /dev/sdp3", "/sbin/mdadm --zero-superblock /dev/sdq3",
               "/sbin/mdadm --zero-superblock /dev/sda3", "/sbin/mdadm --zero-superblock /dev/sdb3",
               "/sbin/mdadm --zero-superblock /dev/sdo3"}));
    EXPECT_EQ(LogText(result), WipedTold("sdp3") + WipedTold("sdq3") + WipedTold("sda3") +
                                   WipedTold("sdb3") + WipedTold("sdo3"));
}

// Twenty-five members: the table has grown to 119 slots, and the order is that of the new table.
TEST(RAIDCleanSuperblock, WipesEveryMemberOfALargeArray)
{
    constexpr int ORDER[] = {15, 25, 11, 21, 18, 14, 24, 10, 20, 17, 27, 13, 23,
                             3,  4,  26, 6,  5,  8,  7,  16, 9,  12, 22, 19};
    MACHINE machine = MachineMake();
    machine.msBound = MANY_COMMANDS_MS;
    DiskWithPartitionsAdd(machine, "sda", 27);
    MachineTool(machine, "/sbin/mdadm -E *", {.szOut = ReportOf(UUID_MD2), .nTimes = 25});
    std::string szExpected;
    for (const int nPartition : ORDER) {
        const std::string szName = "sda" + std::to_string(nPartition);
        MachineTool(machine, WipeCommand(szName));
        szExpected += WipedTold(szName);
    }
    const RUN_RESULT result = MachineCall(machine, [] {
        const RAID_INFO info = {};
        EXPECT_EQ(RAIDCleanSuperblock(&info, UUID_MD2, nullptr), 0);
    });
    EXPECT_EQ(LogText(result), szExpected);
}

TEST(RAIDCleanSuperblock, ComparesWholeUuids)
{
    MACHINE machine = MachineMake();
    DiskWithPartitionsAdd(machine, "sda", 8);
    ExamineExpect(machine, "sda3", "aa:bb");
    ExamineExpect(machine, "sda4", "aa:b");
    ExamineExpect(machine, "sda5", "aa:bbb");
    ExamineExpect(machine, "sda6", "AA:BB");
    ExamineExpect(machine, "sda7", "");
    ExamineExpect(machine, "sda8", "aa:bb (local to host box)");
    MachineTool(machine, WipeCommand("sda3"));
    MachineTool(machine, WipeCommand("sda8"));
    const RUN_RESULT result = MachineCall(machine, [] {
        const RAID_INFO info = {};
        EXPECT_EQ(RAIDCleanSuperblock(&info, "aa:bb", nullptr), 0);
    });
    EXPECT_EQ(LogText(result), WipedTold("sda8") + WipedTold("sda3")); // slots 3 and 16
}

TEST(RAIDCleanSuperblock, AnEmptyUuidIsAValueLikeAnyOther)
{
    MACHINE machine = MachineMake();
    DiskWithPartitionsAdd(machine, "sda", 5);
    ExamineExpect(machine, "sda3", UUID_MD2);
    MachineTool(machine, ExamineCommand("sda4"), {.szOut = "   MBR Magic : aa55\n"});
    BlankMemberExpect(machine, "sda5");
    MachineTool(machine, WipeCommand("sda4"));
    const RUN_RESULT result = MachineCall(machine, [] {
        const RAID_INFO info = {};
        EXPECT_EQ(RAIDCleanSuperblock(&info, "", nullptr), 0);
    });
    EXPECT_EQ(LogText(result), WipedTold("sda4"));
}

TEST(RAIDCleanSuperblock, AFailedWipeLeavesTheLaterOnesUntouched)
{
    MACHINE machine = MachineMake();
    DiskWithPartitionsAdd(machine, "sda", 5);
    for (const char *const szName : {"sda3", "sda4", "sda5"}) {
        ExamineExpect(machine, szName, UUID_MD2);
    }
    // Slots 1, 16 and 17: the second of three.
    MachineTool(machine, WipeCommand("sda4"));
    MachineTool(machine, WipeCommand("sda3"), {.szErr = "mdadm: busy\n", .status = 1});
    const RUN_RESULT result = MachineCall(machine, [] {
        const RAID_INFO info = {};
        RecordReset();
        EXPECT_EQ(RAIDCleanSuperblock(&info, UUID_MD2, nullptr), -1);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
    EXPECT_EQ(LogText(result), WipedTold("sda4") + WipeFailedTold("sda3"));
    EXPECT_EQ(OperationErrors(), "<time> command=\"/sbin/mdadm --zero-superblock /dev/sda3\" "
                                 "Error=\"mdadm: busy \"\n");
}

TEST(RAIDCleanSuperblock, TakesTheCallersMapAndLeavesItToHim)
{
    MACHINE machine = MachineWithMirror();
    MachineTool(machine, WipeCommand("sdb3"));
    const RUN_RESULT result = MachineCall(machine, [] {
        PNLIBHASH pMap = MapOf({{"/dev/sda3", UUID_MD3}, {"/dev/sdb3", UUID_MD2}});
        const RAID_INFO info = {};
        EXPECT_EQ(RAIDCleanSuperblock(&info, UUID_MD2, pMap), 0);
        EXPECT_EQ(KeysOf(pMap), "/dev/sda3\n/dev/sdb3\n");
        NLIBCHashFree(pMap);
    });
    EXPECT_EQ(TranscriptText(result), WipeCommand("sdb3") + "\n");
}

TEST(RAIDCleanSuperblock, AnEmptyMapIsNoFailure)
{
    const RUN_RESULT result = MachineCall(MachineWithMirror(), [] {
        PNLIBHASH pMap = NLIBCHashAlloc(512);
        const RAID_INFO info = {};
        EXPECT_EQ(RAIDCleanSuperblock(&info, UUID_MD2, pMap), 0);
        NLIBCHashFree(pMap);
    });
    EXPECT_EQ(LogText(result), "");
    EXPECT_EQ(TranscriptText(result), "");
}

TEST(RAIDCleanSuperblock, FailsWhenTheMapCannotBeFilled)
{
    MACHINE machine = MachineMake();
    MachineFile(machine, "/proc/partitions", "");
    const RUN_RESULT result = MachineCall(machine, [] {
        const RAID_INFO info = {};
        RecordReset();
        EXPECT_EQ(RAIDCleanSuperblock(&info, UUID_MD2, nullptr), -1);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
    EXPECT_EQ(LogText(result), "<11>partition_enum.cpp:# There's no line in /proc/partitions\n"
                               "<11>raid_remove.cpp:# Fail to enum partition path\n"
                               "<11>raid_remove.cpp:# Fail to get RAID UUID hash\n");
    EXPECT_EQ(TranscriptText(result), "");
}

struct MEMORY_CASE {
    const char *szFunction;
    const char *szLog;
};

constexpr MEMORY_CASE MEMORY_CASES[] = {
    {"malloc", "<11>raid_remove.cpp:# Fail to alloc RAID UUID list\n"},
    {"calloc", "<11>raid_remove.cpp:# Fail to alloc RAID UUID hash\n"},
};

TEST(RAIDCleanSuperblock, FailsWithoutMemoryForListOrMap)
{
    for (const MEMORY_CASE &row : MEMORY_CASES) {
        MACHINE machine = MachineWithMirror();
        machine.faults = {{.szFunction = row.szFunction}};
        const RUN_RESULT result = MachineCall(machine, [] {
            const RAID_INFO info = {};
            EXPECT_EQ(RAIDCleanSuperblock(&info, UUID_MD2, nullptr), -1);
            EXPECT_EQ(NLIBCErrGet(), ERR_OUT_OF_MEMORY);
        });
        EXPECT_EQ(LogText(result), row.szLog);
        EXPECT_EQ(TranscriptText(result), std::string("fault ") + row.szFunction + " 1\n");
    }
}

TEST(RAIDCleanSuperblock, FailsWhenTheKeysDoNotFit)
{
    MACHINE machine = MachineMake();
    machine.faults = {{.szFunction = "malloc", .nCall = 2}}; // the first is the list itself
    PNLIBHASH pMap = MapOf({{std::string(300, 'a'), UUID_MD2}, {std::string(300, 'b'), UUID_MD2}});
    const RUN_RESULT result = MachineCall(machine, [pMap] {
        const RAID_INFO info = {};
        EXPECT_EQ(RAIDCleanSuperblock(&info, UUID_MD2, pMap), -1);
        EXPECT_EQ(NLIBCErrGet(), ERR_OUT_OF_MEMORY);
        EXPECT_EQ(pMap->nEntry, 2);
    });
    NLIBCHashFree(pMap);
    EXPECT_EQ(LogText(result), "<11>raid_remove.cpp:# Fail to get hash key list\n");
    EXPECT_EQ(TranscriptText(result), "fault malloc 2\n");
}

// ---- removing ----------------------------------------------------------------------------------

TEST(RAIDRemove, StopsThenCleans)
{
    MACHINE machine = MachineWithMirror();
    ExamineExpect(machine, "sdb3", UUID_MD2, 2);
    MachineTool(machine, STOP_MD2);
    ExamineExpect(machine, "sda3", UUID_MD2);
    MachineTool(machine, WipeCommand("sda3"));
    MachineTool(machine, WipeCommand("sdb3"));
    const RUN_RESULT result = MachineCall(machine, [] {
        const RAID_INFO info = RecordOf("/dev/md2");
        RecordReset();
        EXPECT_EQ(RAIDRemoveByInfo(&info), 0);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
    EXPECT_EQ(TranscriptText(result), Lines({"/sbin/mdadm -E /dev/sdb3", "/sbin/mdadm -S /dev/md2",
                                             "/sbin/mdadm -E /dev/sda3", "/sbin/mdadm -E /dev/sdb3",
                                             "/sbin/mdadm --zero-superblock /dev/sda3",
                                             "/sbin/mdadm --zero-superblock /dev/sdb3"}));
    EXPECT_EQ(LogText(result), CLEAN_TOLD + WipedTold("sda3") + WipedTold("sdb3"));
}

TEST(RAIDRemove, TakesTheUuidOfTheRecord)
{
    MACHINE machine = MachineWithMirror();
    MachineTool(machine, STOP_MD2);
    ExamineExpect(machine, "sda3", UUID_MD2);
    ExamineExpect(machine, "sdb3", UUID_MD3);
    MachineTool(machine, WipeCommand("sdb3"));
    const RUN_RESULT result = MachineCall(machine, [] {
        const RAID_INFO info = RecordOf("/dev/md2", UUID_MD3);
        EXPECT_EQ(RAIDRemove(&info, nullptr), 0);
    });
    EXPECT_EQ(TranscriptText(result),
              Lines({"/sbin/mdadm -S /dev/md2", "/sbin/mdadm -E /dev/sda3",
                     "/sbin/mdadm -E /dev/sdb3", "/sbin/mdadm --zero-superblock /dev/sdb3"}));
    EXPECT_EQ(LogText(result), CLEAN_TOLD + WipedTold("sdb3"));
}

// As many characters as a report's UUID can have, and all of them count.
TEST(RAIDRemove, TakesTheWholeUuidOfTheRecord)
{
    const std::string szUuid = std::string(62, 'a') + "b";
    MACHINE machine = MachineWithMirror();
    MachineTool(machine, STOP_MD2);
    ExamineExpect(machine, "sda3", std::string(62, 'a') + "c");
    ExamineExpect(machine, "sdb3", szUuid);
    MachineTool(machine, WipeCommand("sdb3"));
    const RUN_RESULT result = MachineCall(machine, [&szUuid] {
        const RAID_INFO info = RecordOf("/dev/md2", szUuid);
        EXPECT_EQ(RAIDRemove(&info, nullptr), 0);
    });
    EXPECT_EQ(LogText(result), CLEAN_TOLD + WipedTold("sdb3"));
}

TEST(RAIDRemove, TakesTheWholeUuidOfTheMember)
{
    const std::string szUuid = std::string(62, 'a') + "b";
    MACHINE machine = MachineWithMirror();
    ExamineExpect(machine, "sda3", std::string(62, 'a') + "c");
    ExamineExpect(machine, "sdb3", szUuid, 2);
    MachineTool(machine, STOP_MD2);
    MachineTool(machine, WipeCommand("sdb3"));
    const RUN_RESULT result = MachineCall(machine, [] {
        const RAID_INFO info = RecordOf("/dev/md2");
        EXPECT_EQ(RAIDRemove(&info, nullptr), 0);
    });
    EXPECT_EQ(LogText(result), CLEAN_TOLD + WipedTold("sdb3"));
}

TEST(RAIDRemove, TakesTheCallersMapAndLeavesItToHim)
{
    MACHINE machine = MachineWithMirror();
    ExamineExpect(machine, "sdb3", UUID_MD2); // for the UUID alone
    MachineTool(machine, STOP_MD2);
    MachineTool(machine, WipeCommand("sdz9"));
    const RUN_RESULT result = MachineCall(machine, [] {
        PNLIBHASH pMap = MapOf({{"/dev/sda3", UUID_MD3}, {"/dev/sdz9", UUID_MD2}});
        const RAID_INFO info = RecordOf("/dev/md2");
        EXPECT_EQ(RAIDRemove(&info, pMap), 0);
        EXPECT_STREQ(NLIBCHashGet(pMap, "/dev/sdz9"), UUID_MD2);
        NLIBCHashFree(pMap);
    });
    EXPECT_EQ(LogText(result), CLEAN_TOLD + WipedTold("sdz9"));
}

TEST(RAIDRemove, AStopThatFailsTwiceIsTriedAgain)
{
    MACHINE machine = MachineWithMirror();
    MachineTool(machine, STOP_MD2, {.szErr = "mdadm: busy\n", .status = 1, .nTimes = 2});
    MachineTool(machine, STOP_MD2);
    ExamineExpect(machine, "sda3", UUID_MD2);
    ExamineExpect(machine, "sdb3", UUID_MD2);
    MachineTool(machine, WipeCommand("sda3"));
    MachineTool(machine, WipeCommand("sdb3"));
    const RUN_RESULT result = MachineCall(machine, [] {
        const RAID_INFO info = RecordOf("/dev/md2", UUID_MD2);
        EXPECT_EQ(RAIDRemoveByInfo(&info), 0);
    });
    EXPECT_EQ(TranscriptText(result),
              Lines({STOP_MD2, "sleep 1", STOP_MD2, "sleep 1", STOP_MD2, "/sbin/mdadm -E /dev/sda3",
                     "/sbin/mdadm -E /dev/sdb3", "/sbin/mdadm --zero-superblock /dev/sda3",
                     "/sbin/mdadm --zero-superblock /dev/sdb3"}));
    EXPECT_EQ(LogText(result), std::string(STOP_TOLD) + STOP_TOLD + CLEAN_TOLD + WipedTold("sda3") +
                                   WipedTold("sdb3"));
    const std::string szError =
        "<time> command=\"/sbin/mdadm -S /dev/md2\" Error=\"mdadm: busy \"\n";
    EXPECT_EQ(OperationErrors(), szError + szError);
}

TEST(RAIDRemove, AStopThatNeverSucceedsTouchesNoSuperblock)
{
    MACHINE machine = MachineWithMirror();
    ExamineExpect(machine, "sdb3", UUID_MD2);
    MachineTool(machine, STOP_MD2, {.status = 1, .nTimes = 3});
    const RUN_RESULT result = MachineCall(machine, [] {
        const RAID_INFO info = RecordOf("/dev/md2");
        RecordReset();
        EXPECT_EQ(RAIDRemoveByInfo(&info), -1);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
    EXPECT_EQ(TranscriptText(result), Lines({"/sbin/mdadm -E /dev/sdb3", STOP_MD2, "sleep 1",
                                             STOP_MD2, "sleep 1", STOP_MD2, "sleep 1"}));
    EXPECT_EQ(LogText(result), std::string(STOP_TOLD) + STOP_TOLD + STOP_TOLD + LIMIT_TOLD);
    EXPECT_EQ(MachineFileRead("/var/log/space_operation_error.log"), std::nullopt);
}

TEST(RAIDRemove, WithoutAUuidItOnlyStops)
{
    MACHINE machine = MachineWithMirror();
    BlankMemberExpect(machine, "sdb3");
    MachineTool(machine, STOP_MD2);
    const RUN_RESULT result = MachineCall(machine, [] {
        const RAID_INFO info = RecordOf("/dev/md2");
        EXPECT_EQ(RAIDRemoveByInfo(&info), 0);
    });
    EXPECT_EQ(TranscriptText(result), Lines({"/sbin/mdadm -E /dev/sdb3", STOP_MD2}));
    EXPECT_EQ(LogText(result), "<11>raid_remove.cpp:# Disk [/dev/sdb3] in RAID [/dev/md2] has no "
                               "RAID superblock, ret=0\n");
}

TEST(RAIDRemove, AnArrayThatDoesNotRunIsStoppedAllTheSame)
{
    MACHINE machine = MachineMake();
    DiskWithPartitionsAdd(machine, "sda", 3);
    MachineTool(machine, STOP_MD2);
    const RUN_RESULT result = MachineCall(machine, [] {
        const RAID_INFO info = RecordOf("/dev/md2");
        EXPECT_EQ(RAIDRemoveByInfo(&info), 0);
    });
    EXPECT_EQ(TranscriptText(result), Lines({STOP_MD2}));
    EXPECT_EQ(LogText(result),
              "<15>raid_info.cpp:# Failed to open /dev/md2, errno=No such file or directory\n"
              "<11>raid_remove.cpp:# Failed to get RAID info [/dev/md2], ret = -1\n");
}

TEST(RAIDRemove, AnEmptyUuidThatWasReadIsCleanedToo)
{
    MACHINE machine = MachineWithMirror();
    MachineTool(machine, ExamineCommand("sdb3"), {.szOut = "   MBR Magic : aa55\n", .nTimes = 2});
    ExamineExpect(machine, "sda3", UUID_MD2);
    MachineTool(machine, STOP_MD2);
    MachineTool(machine, WipeCommand("sdb3"));
    const RUN_RESULT result = MachineCall(machine, [] {
        const RAID_INFO info = RecordOf("/dev/md2");
        EXPECT_EQ(RAIDRemoveByInfo(&info), 0);
    });
    EXPECT_EQ(LogText(result), CLEAN_TOLD + WipedTold("sdb3"));
}

TEST(RAIDRemove, ACleaningThatFailsIsNoFailure)
{
    MACHINE machine = MachineWithMirror();
    MachineTool(machine, STOP_MD2);
    ExamineExpect(machine, "sda3", UUID_MD2);
    ExamineExpect(machine, "sdb3", UUID_MD2);
    MachineTool(machine, WipeCommand("sda3"), {.signal = SIGKILL});
    const RUN_RESULT result = MachineCall(machine, [] {
        const RAID_INFO info = RecordOf("/dev/md2", UUID_MD2);
        EXPECT_EQ(RAIDRemoveByInfo(&info), 0);
    });
    EXPECT_EQ(LogText(result), CLEAN_TOLD + WipeFailedTold("sda3"));
}

TEST(RAIDRemove, MembersOfOtherArraysAreLeftAlone)
{
    MACHINE machine = MachineMake();
    for (const char *const szDisk : {"sda", "sdb"}) {
        DiskWithPartitionsAdd(machine, szDisk, 5);
        for (const char *const szNumber : {"3", "4", "5"}) {
            ExamineExpect(machine, std::string(szDisk) + szNumber,
                          *szNumber == '4' ? UUID_MD3 : UUID_MD2);
        }
    }
    MachineTool(machine, STOP_MD2);
    for (const char *const szName : {"sda3", "sda5", "sdb3", "sdb5"}) {
        MachineTool(machine, WipeCommand(szName));
    }
    const RUN_RESULT result = MachineCall(machine, [] {
        const RAID_INFO info = RecordOf("/dev/md2", UUID_MD2);
        EXPECT_EQ(RAIDRemoveByInfo(&info), 0);
    });
    EXPECT_EQ(LogText(result), CLEAN_TOLD + WipedTold("sda3") + WipedTold("sda5") +
                                   WipedTold("sdb3") + WipedTold("sdb5"));
}

} // namespace
