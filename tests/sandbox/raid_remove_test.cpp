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

struct COMMAND_CASE {
    TOOL_ANSWER answer;
    int result;
};

const COMMAND_CASE COMMAND_CASES[] = {
    {{}, 0},
    {{.szErr = "mdadm: stopped\n"}, 0}, // only the status counts
    {{.status = 1}, -1},
    {{.szErr = "mdadm: busy\n", .status = 255}, -1},
    {{.signal = SIGKILL}, -1},
};

const STEP STOP_TOLD = {"<11>raid_remove.cpp:# Failed to mdadm stop '/dev/md2'"};
const STEP ZERO_TOLD = {"<11>raid_remove.cpp:# Failed to zero RAID superblock '/dev/sda3'"};

long long Stop()
{
    return RAIDStop("/dev/md2");
}

long long Zero()
{
    return RAIDZeroSuperblock("/dev/sda3");
}

TEST(RAIDRemove, StopAndZeroAreOneCommandEach)
{
    for (const COMMAND_CASE &row : COMMAND_CASES) {
        SCOPED_TRACE(testing::Message() << row.answer.status << row.answer.szErr);
        const STEPS stop = {{STOP_MD2, row.answer}};
        const STEPS zero = {{"/sbin/mdadm --zero-superblock /dev/sda3", row.answer}};
        ExpectCalls({{.szName = "stop",
                      .call = Stop,
                      .result = row.result,
                      .steps = row.result == 0 ? stop : stop + STEPS{STOP_TOLD}},
                     {.szName = "zero",
                      .call = Zero,
                      .result = row.result,
                      .steps = row.result == 0 ? zero : zero + STEPS{ZERO_TOLD}}});
    }
}

TEST(RAIDRemove, AToolThatCannotBeRunFails)
{
    const MACHINE missing = WithTool(MachineMake(), "/sbin/mdadm", TOOL_KIND::MISSING);
    ExpectCalls({{.szName = "no pipe",
                  .machine = WithFault(MachineMake(), {.szFunction = "pipe2", .error = EMFILE}),
                  .call = Stop,
                  .result = -1,
                  .code = ERR_BAD_PARAMETER, // of the stream that is not there
                  .steps = {{"fault pipe2 1"}, STOP_TOLD}},
                 {.szName = "nothing to stop with",
                  .machine = missing,
                  .call = Stop,
                  .result = -1,
                  .steps = {STOP_TOLD}},
                 {.szName = "nothing to wipe with",
                  .machine = missing,
                  .call = Zero,
                  .result = -1,
                  .steps = {ZERO_TOLD}}});
}

TEST(RAIDRemove, BadArgumentsAreLoggedAndRunNothing)
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

// That of md2, in a buffer of so many bytes; what is behind them stays.
long long UuidGet(const std::string &szExpected, int cbBuf = 64)
{
    char szUuid[65];
    memset(szUuid, 'x', sizeof(szUuid));
    const int result = RAIDUUIDGet("/dev/md2", szUuid, cbBuf);
    EXPECT_EQ(szUuid[cbBuf], 'x');
    szUuid[64] = '\0';
    EXPECT_EQ(std::string(szUuid), result == 1 ? szExpected : std::string(64, 'x'));
    return result;
}

long long UuidFail()
{
    return UuidGet("");
}

TEST(RAIDUUIDGet, IsThatOfTheMemberThatSortsLast)
{
    const STEPS examined = {Examined("sdb3", UUID_MD2)};
    ExpectCalls({{.szName = "whole",
                  .machine = MachineWithMirror(),
                  .call = [] { return UuidGet(UUID_MD2); },
                  .result = 1,
                  .steps = examined},
                 {.szName = "cut to the buffer",
                  .machine = MachineWithMirror(),
                  .call = [] { return UuidGet("5b1f", 5); },
                  .result = 1,
                  .steps = examined},
                 {.szName = "no room",
                  .machine = MachineWithMirror(),
                  .call = [] { return UuidGet("", 1); },
                  .result = 1,
                  .steps = examined}});
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

TEST(RAIDUUIDGet, FailsWithoutAnArrayMembersOrASuperblock)
{
    const STEP told = {"<11>raid_remove.cpp:# Failed to get RAID info [/dev/md2], ret = -1"};
    MACHINE inactive = MachineWithMirror();
    inactive.arrays[0].errnoInfo = ENODEV;
    MACHINE empty = MachineMake();
    MachineMdAdd(empty, {.nMd = 2});
    ExpectCalls(
        {{.szName = "no array",
          .call = UuidFail,
          .result = -1,
          .code = ERR_OPEN_FAILED,
          .steps =
              {{"<15>raid_info.cpp:# Failed to open /dev/md2, errno=No such file or directory"},
               told}},
         // The driver's "no such device" ends up as a plain failure.
         {.szName = "inactive",
          .machine = inactive,
          .call = UuidFail,
          .result = -1,
          .code = ERR_SYSCALL_FAILED,
          .steps = {{"<15>raid_info.cpp:# Failed to ioctl for raid status, errno=No such device"},
                    {"<15>raid_info.cpp:# Failed to ioctl for raid status, errno=0X8000"},
                    told}},
         {.szName = "no members",
          .machine = empty,
          .call = UuidFail,
          .result = -1,
          .code = ERR_NO_MEMBER_DISK},
         {.szName = "a blank member",
          .machine = MachineWithMirror(),
          .call = UuidFail,
          .result = -1,
          .steps = {ExaminedBlank("sdb3"),
                    {"<11>raid_remove.cpp:# Disk [/dev/sdb3] in RAID [/dev/md2] has no RAID "
                     "superblock, ret=0"}}},
         {.szName = "a broken report",
          .machine = MachineWithMirror(),
          .call = UuidFail,
          .result = -1,
          .steps = {{"/sbin/mdadm -E /dev/sdb3", {.szOut = "Version : none\n"}},
                    {"<11>raid_superblock.cpp:# bad version format: 'none'."},
                    {"<11>raid_remove.cpp:# Disk [/dev/sdb3] in RAID [/dev/md2] has no RAID "
                     "superblock, ret=-1"}}}});
}

// ---- the map -----------------------------------------------------------------------------------

// Fills a fresh map, of which the body may say what is in it.
long long MapFill(const std::function<void(const NLIBHASH *)> &body,
                  const std::vector<std::pair<std::string, std::string>> &pairs = {})
{
    PNLIBHASH pMap = MapOf(pairs);
    const int result = RAIDUUIDHashForRemoveGet(&pMap);
    body(pMap);
    NLIBCHashFree(pMap);
    return result;
}

long long MapFillNothing()
{
    return MapFill([](const NLIBHASH *pMap) { EXPECT_EQ(pMap->nEntry, 0); });
}

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
    STEPS steps;
    for (const std::string &szName : examined) {
        steps.push_back(Examined(szName, "uuid of " + szName));
    }
    const auto body = [&examined](const NLIBHASH *pMap) {
        EXPECT_EQ(pMap->nEntry, 8);
        for (const std::string &szName : examined) {
            EXPECT_EQ(std::string(NLIBCHashGet(pMap, ("/dev/" + szName).c_str())),
                      "uuid of " + szName);
        }
    };
    (void)ExpectCall({.szName = "seven disks",
                      .machine = machine,
                      .call = [&body] { return MapFill(body); },
                      .steps = steps});
}

TEST(RAIDUUIDHashForRemoveGet, LeavesOutWhatHasNoSuperblock)
{
    MACHINE machine = MachineMake();
    DiskWithPartitionsAdd(machine, "sda", 6);
    const auto body = [](const NLIBHASH *pMap) {
        EXPECT_EQ(KeysOf(pMap), "/dev/sda6\n/dev/sda5\n"); // slots 2 and 17
        EXPECT_STREQ(NLIBCHashGet(pMap, "/dev/sda5"), ""); // a report, and no UUID in it
        EXPECT_STREQ(NLIBCHashGet(pMap, "/dev/sda6"), UUID_MD2);
    };
    (void)ExpectCall(
        {.szName = "four reports",
         .machine = machine,
         .call = [&body] { return MapFill(body); },
         .steps = {ExaminedBlank("sda3"),
                   {"/sbin/mdadm -E /dev/sda4",
                    {.szOut = "UUID : half read\nDevice Role : Journal\nUUID : never\n"}},
                   {"<11>raid_superblock.cpp:# bad device order format: 'Journal'."},
                   {"/sbin/mdadm -E /dev/sda5", {.szOut = "   MBR Magic : aa55\n"}},
                   Examined("sda6", UUID_MD2)}});
}

TEST(RAIDUUIDHashForRemoveGet, AddsToTheMapAndFollowsIt)
{
    MACHINE machine = MachineMake();
    for (const char *const szDisk : {"sda", "sdb", "sdc", "sdd", "sde"}) {
        DiskWithPartitionsAdd(machine, szDisk, 8);
    }
    MachineTool(machine, "/sbin/mdadm -E *", {.szOut = ReportOf(UUID_MD2), .nTimes = 30});
    MachineCall(machine, [] {
        const auto body = [](const NLIBHASH *pMap) {
            EXPECT_EQ(pMap->nSlot, 119); // more than three quarters of 31 slots
            EXPECT_EQ(pMap->nEntry, 31);
            EXPECT_STREQ(NLIBCHashGet(pMap, "/dev/sda3"), UUID_MD2);
            EXPECT_STREQ(NLIBCHashGet(pMap, "/dev/sde8"), UUID_MD2);
            EXPECT_STREQ(NLIBCHashGet(pMap, "/dev/sdz3"), "kept");
        };
        EXPECT_EQ(MapFill(body, {{"/dev/sda3", "old"}, {"/dev/sdz3", "kept"}}), 0);
    });
}

TEST(RAIDUUIDHashForRemoveGet, TellsAMachineWithoutPartitionsFromAFailure)
{
    ExpectCalls(
        {{.szName = "a map that refuses a pair",
          .machine = MachineWithMirror(),
          .call =
              [] {
                  PNLIBHASH pMap = nullptr;
                  const int result = RAIDUUIDHashForRemoveGet(&pMap);
                  EXPECT_EQ(pMap, nullptr);
                  return result;
              },
          .steps = {Examined("sda3", UUID_MD2), Examined("sdb3", UUID_MD2)}},
         {.szName = "no partitions",
          .machine = WithFile(MachineMake(), "/proc/partitions", "\n"),
          .call = MapFillNothing},
         {.szName = "no list of the kernel",
          .machine = Without(MachineMake(), "/proc/partitions"),
          .call = MapFillNothing,
          .result = -1,
          .code = ERR_OPEN_FAILED,
          .steps = {
              {"<11>partition_enum.cpp:# Failed to read line of /proc/partitions, errno=0x900"},
              {"<11>raid_remove.cpp:# Fail to enum partition path"}}}});
}

// ---- cleaning ----------------------------------------------------------------------------------

long long Clean(const char *szUuid = UUID_MD2, PNLIBHASH pMap = nullptr)
{
    const RAID_INFO info = {};
    return RAIDCleanSuperblock(&info, szUuid, pMap);
}

// The home slots of sda3, sdb3, ... sdp3 are 16, 17, ... 31, and the last is slot 0 of 31.
TEST(RAIDCleanSuperblock, WipesInTheOrderOfTheMap)
{
    MACHINE machine = MachineMake();
    STEPS steps;
    for (const std::string szDisk : {"sda", "sdb", "sdo", "sdp", "sdq"}) {
        DiskWithPartitionsAdd(machine, szDisk, 3);
        steps.push_back(Examined(szDisk + "3", UUID_MD2));
    }
    (void)ExpectCall({.szName = "five disks",
                      .machine = machine,
                      .call = [] { return Clean(); },
                      .steps = steps + Wiped("sdp3") + Wiped("sdq3") + Wiped("sda3") +
                               Wiped("sdb3") + Wiped("sdo3")});
}

// Twenty-five members: the table has grown to 119 slots, and the order is that of the new table.
TEST(RAIDCleanSuperblock, WipesEveryMemberOfALargeArray)
{
    constexpr int ORDER[] = {15, 25, 11, 21, 18, 14, 24, 10, 20, 17, 27, 13, 23,
                             3,  4,  26, 6,  5,  8,  7,  16, 9,  12, 22, 19};
    MACHINE machine = MachineMake();
    DiskWithPartitionsAdd(machine, "sda", 27);
    // The order of the questions is told elsewhere.
    MachineTool(machine, "/sbin/mdadm -E *", {.szOut = ReportOf(UUID_MD2), .nTimes = 25});
    STEPS wiped;
    for (const int nPartition : ORDER) {
        wiped = wiped + Wiped("sda" + std::to_string(nPartition));
    }
    StepsExpect(machine, wiped);
    RUN_RESULT result = MachineCall(machine, [] { EXPECT_EQ(Clean(), 0); });
    result.events.erase(result.events.begin(), result.events.begin() + 25);
    ExpectSteps(result, wiped);
}

TEST(RAIDCleanSuperblock, ComparesWholeUuids)
{
    MACHINE machine = MachineMake();
    DiskWithPartitionsAdd(machine, "sda", 8);
    (void)ExpectCall(
        {.szName = "six UUIDs",
         .machine = machine,
         .call = [] { return Clean("aa:bb"); },
         .steps = STEPS{Examined("sda3", "aa:bb"), Examined("sda4", "aa:b"),
                        Examined("sda5", "aa:bbb"), Examined("sda6", "AA:BB"), Examined("sda7", ""),
                        Examined("sda8", "aa:bb (local to host box)")} +
                  Wiped("sda8") + Wiped("sda3")}); // slots 3 and 16
}

TEST(RAIDCleanSuperblock, AnEmptyUuidIsAValueLikeAnyOther)
{
    MACHINE machine = MachineMake();
    DiskWithPartitionsAdd(machine, "sda", 5);
    (void)ExpectCall(
        {.szName = "no UUID",
         .machine = machine,
         .call = [] { return Clean(""); },
         .steps = STEPS{Examined("sda3", UUID_MD2),
                        {"/sbin/mdadm -E /dev/sda4", {.szOut = "   MBR Magic : aa55\n"}},
                        ExaminedBlank("sda5")} +
                  Wiped("sda4")});
}

TEST(RAIDCleanSuperblock, AFailedWipeLeavesTheLaterOnesUntouched)
{
    MACHINE machine = MachineMake();
    DiskWithPartitionsAdd(machine, "sda", 5);
    // Slots 1, 16 and 17: the second of three.
    (void)ExpectCall({.szName = "the second fails",
                      .machine = machine,
                      .call = [] { return Clean(); },
                      .result = -1,
                      .steps = STEPS{Examined("sda3", UUID_MD2), Examined("sda4", UUID_MD2),
                                     Examined("sda5", UUID_MD2)} +
                               Wiped("sda4") +
                               WipeFailed("sda3", {.szErr = "mdadm: busy\n", .status = 1})});
    EXPECT_EQ(OperationErrors(),
              "Nov 05 01:02:03 command=\"/sbin/mdadm --zero-superblock /dev/sda3\" "
              "Error=\"mdadm: busy \"\n");
}

TEST(RAIDCleanSuperblock, TakesTheCallersMapAndLeavesItToHim)
{
    const auto cleanBy = [] {
        PNLIBHASH pMap = MapOf({{"/dev/sda3", UUID_MD3}, {"/dev/sdb3", UUID_MD2}});
        const long long result = Clean(UUID_MD2, pMap);
        EXPECT_EQ(KeysOf(pMap), "/dev/sda3\n/dev/sdb3\n");
        NLIBCHashFree(pMap);
        return result;
    };
    const auto cleanByEmpty = [] {
        PNLIBHASH pMap = NLIBCHashAlloc(512);
        const long long result = Clean(UUID_MD2, pMap);
        NLIBCHashFree(pMap);
        return result;
    };
    ExpectCalls({{.szName = "a map of two",
                  .machine = MachineWithMirror(),
                  .call = cleanBy,
                  .steps = Wiped("sdb3")},
                 {.szName = "an empty map", .machine = MachineWithMirror(), .call = cleanByEmpty}});
}

TEST(RAIDCleanSuperblock, FailsWhenListOrMapCannotBeMadeOrFilled)
{
    PNLIBHASH pMap = MapOf({{std::string(300, 'a'), UUID_MD2}, {std::string(300, 'b'), UUID_MD2}});
    ExpectCalls(
        {{.szName = "no partitions",
          .machine = WithFile(MachineMake(), "/proc/partitions", ""),
          .call = [] { return Clean(); },
          .result = -1,
          .steps = {{"<11>partition_enum.cpp:# There's no line in /proc/partitions"},
                    {"<11>raid_remove.cpp:# Fail to enum partition path"},
                    {"<11>raid_remove.cpp:# Fail to get RAID UUID hash"}}},
         {.szName = "no list",
          .machine = WithFault(MachineWithMirror(), {.szFunction = "malloc"}),
          .call = [] { return Clean(); },
          .result = -1,
          .code = ERR_OUT_OF_MEMORY,
          .steps = {{"fault malloc 1"}, {"<11>raid_remove.cpp:# Fail to alloc RAID UUID list"}}},
         {.szName = "no map",
          .machine = WithFault(MachineWithMirror(), {.szFunction = "calloc"}),
          .call = [] { return Clean(); },
          .result = -1,
          .code = ERR_OUT_OF_MEMORY,
          .steps = {{"fault calloc 1"}, {"<11>raid_remove.cpp:# Fail to alloc RAID UUID hash"}}},
         {.szName = "no list of the map's own",
          .machine = WithFault(MachineWithMirror(), {.szFunction = "malloc"}),
          .call = [&pMap] { return RAIDUUIDHashForRemoveGet(&pMap); },
          .result = -1,
          .code = ERR_OUT_OF_MEMORY,
          .steps = {{"fault malloc 1"}, {"<11>raid_remove.cpp:# Fail to alloc RAID UUID list"}}},
         {.szName = "keys that do not fit", // the first is the list itself
          .machine = WithFault(MachineMake(), {.szFunction = "malloc", .nCall = 2}),
          .call = [pMap] { return Clean(UUID_MD2, pMap); },
          .result = -1,
          .code = ERR_OUT_OF_MEMORY,
          .steps = {{"fault malloc 2"}, {"<11>raid_remove.cpp:# Fail to get hash key list"}}}});
    EXPECT_EQ(pMap->nEntry, 2);
    NLIBCHashFree(pMap);
}

// ---- removing ----------------------------------------------------------------------------------

// What a mirror's removal does, when its record has this UUID.
void ExpectRemoval(const char *szName, const STEPS &steps, const std::string &szUuid = "",
                   int result = 0, const MACHINE &machine = MachineWithMirror(),
                   u32 code = OLD_CODE)
{
    const auto call = [&szUuid] {
        const RAID_INFO info = RecordOf("/dev/md2", szUuid);
        return RAIDRemoveByInfo(&info);
    };
    (void)ExpectCall({.szName = szName,
                      .machine = machine,
                      .call = call,
                      .result = result,
                      .code = code,
                      .steps = steps});
}

TEST(RAIDRemove, StopsThenCleans)
{
    ExpectRemoval("a mirror", STEPS{Examined("sdb3", UUID_MD2), {STOP_MD2}} + MirrorWiped());
}

// As many characters as a report's UUID can have, and all of them count.
TEST(RAIDRemove, TakesTheWholeUuidOfTheRecordElseOfTheMember)
{
    const std::string szUuid = std::string(62, 'a') + "b";
    const std::string szOther = std::string(62, 'a') + "c";
    const STEPS cleaned =
        STEPS{{STOP_MD2}, CLEAN_TOLD, Examined("sda3", szOther), Examined("sdb3", szUuid)} +
        Wiped("sdb3");
    ExpectRemoval("of the record", cleaned, szUuid);
    ExpectRemoval("of the member", STEPS{Examined("sdb3", szUuid)} + cleaned);
}

TEST(RAIDRemove, TakesTheCallersMapAndLeavesItToHim)
{
    const auto call = [] {
        PNLIBHASH pMap = MapOf({{"/dev/sda3", UUID_MD3}, {"/dev/sdz9", UUID_MD2}});
        const RAID_INFO info = RecordOf("/dev/md2");
        const int result = RAIDRemove(&info, pMap);
        EXPECT_STREQ(NLIBCHashGet(pMap, "/dev/sdz9"), UUID_MD2);
        NLIBCHashFree(pMap);
        return result;
    };
    (void)ExpectCall(
        {.szName = "for the UUID alone",
         .machine = MachineWithMirror(),
         .call = call,
         .steps = STEPS{Examined("sdb3", UUID_MD2), {STOP_MD2}, CLEAN_TOLD} + Wiped("sdz9")});
}

TEST(RAIDRemove, AStopIsTriedThreeTimes)
{
    const STEPS failed = StopFailed({.szErr = "mdadm: busy\n", .status = 1});
    ExpectRemoval("twice", 2 * failed + STEPS{{STOP_MD2}} + MirrorWiped(), UUID_MD2);
    const std::string szError =
        "Nov 05 01:02:03 command=\"/sbin/mdadm -S /dev/md2\" Error=\"mdadm: busy \"\n";
    EXPECT_EQ(OperationErrors(), szError + szError);
    ExpectRemoval("always", 3 * StopFailed({.status = 1}) + STEPS{LIMIT_TOLD}, UUID_MD2, -1);
    EXPECT_EQ(OperationErrors(), "");
}

TEST(RAIDRemove, WithoutAUuidItOnlyStops)
{
    ExpectRemoval("a blank member",
                  {ExaminedBlank("sdb3"),
                   {"<11>raid_remove.cpp:# Disk [/dev/sdb3] in RAID [/dev/md2] has no RAID "
                    "superblock, ret=0"},
                   {STOP_MD2}});
    MACHINE machine = MachineMake();
    DiskWithPartitionsAdd(machine, "sda", 3);
    ExpectRemoval("an array that does not run",
                  {{"<15>raid_info.cpp:# Failed to open /dev/md2, errno=No such file or directory"},
                   {"<11>raid_remove.cpp:# Failed to get RAID info [/dev/md2], ret = -1"},
                   {STOP_MD2}},
                  "", 0, machine, ERR_OPEN_FAILED);
}

TEST(RAIDRemove, AnEmptyUuidThatWasReadIsCleanedToo)
{
    const STEP examined = {"/sbin/mdadm -E /dev/sdb3", {.szOut = "   MBR Magic : aa55\n"}};
    ExpectRemoval("no UUID",
                  STEPS{examined, {STOP_MD2}, CLEAN_TOLD, Examined("sda3", UUID_MD2), examined} +
                      Wiped("sdb3"));
}

TEST(RAIDRemove, ACleaningThatFailsIsNoFailure)
{
    ExpectRemoval(
        "killed",
        STEPS{{STOP_MD2}, CLEAN_TOLD, Examined("sda3", UUID_MD2), Examined("sdb3", UUID_MD2)} +
            WipeFailed("sda3", {.signal = SIGKILL}),
        UUID_MD2);
}

TEST(RAIDRemove, MembersOfOtherArraysAreLeftAlone)
{
    MACHINE machine = MachineMake();
    STEPS steps = {{STOP_MD2}, CLEAN_TOLD};
    for (const std::string szDisk : {"sda", "sdb"}) {
        DiskWithPartitionsAdd(machine, szDisk, 5);
        steps = steps + STEPS{Examined(szDisk + "3", UUID_MD2), Examined(szDisk + "4", UUID_MD3),
                              Examined(szDisk + "5", UUID_MD2)};
    }
    ExpectRemoval("two arrays",
                  steps + Wiped("sda3") + Wiped("sda5") + Wiped("sdb3") + Wiped("sdb5"), UUID_MD2,
                  0, machine);
}

} // namespace
