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

// One call of a row's name, on this machine.
void Expect(const char *szName, const std::function<long long()> &call, int result,
            const STEPS &steps, const MACHINE &machine = MachineWithMirror(), u32 code = OLD_CODE)
{
    (void)ExpectCall({szName, machine, call, result, code, steps});
}

// ---- one command -------------------------------------------------------------------------------

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
    for (const TOOL_ANSWER &answer : {TOOL_ANSWER{}, {.szErr = "mdadm: stopped\n"}}) {
        Expect("stop", Stop, 0, {{STOP_MD2, answer}}); // only the status counts
        Expect("zero", Zero, 0, {{"/sbin/mdadm --zero-superblock /dev/sda3", answer}});
    }
    for (const TOOL_ANSWER &answer : {TOOL_ANSWER{.status = 1},
                                      {.szErr = "mdadm: busy\n", .status = 255},
                                      {.signal = SIGKILL}}) {
        Expect("stop", Stop, -1, {{STOP_MD2, answer}, STOP_TOLD});
        Expect("zero", Zero, -1, {{"/sbin/mdadm --zero-superblock /dev/sda3", answer}, ZERO_TOLD});
    }
}

TEST(RAIDRemove, AToolThatCannotBeRunFails)
{
    const MACHINE missing = WithTool(MachineMake(), "/sbin/mdadm", TOOL_KIND::MISSING);
    Expect("nothing to stop with", Stop, -1, {STOP_TOLD}, missing);
    Expect("nothing to wipe with", Zero, -1, {ZERO_TOLD}, missing);
    Expect("no pipe", Stop, -1, {{"fault pipe2 1"}, STOP_TOLD},
           WithFault(MachineMake(), {.szFunction = "pipe2", .error = EMFILE}),
           ERR_BAD_PARAMETER); // of the stream that is not there
}

TEST(RAIDRemove, BadArgumentsAreLoggedAndRunNothing)
{
    const RAID_INFO info = RecordOf("/dev/md2");
    for (const std::function<long long()> &call : std::vector<std::function<long long()>>{
             [] { return RAIDRemoveByInfo(nullptr); },
             [] { return RAIDRemove(nullptr, nullptr); },
             [] { return RAIDStop(nullptr); },
             [] { return RAIDZeroSuperblock(nullptr); },
             [] { return RAIDCleanSuperblock(nullptr, "uuid", nullptr); },
             [&info] { return RAIDCleanSuperblock(&info, nullptr, nullptr); },
             [] { return RAIDUUIDHashForRemoveGet(nullptr); },
         }) {
        Expect("null", call, -1, {{"<11>raid_remove.cpp:# Bad parameters"}});
    }
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
    Expect("whole", [] { return UuidGet(UUID_MD2); }, 1, examined);
    Expect("cut to the buffer", [] { return UuidGet("5b1f", 5); }, 1, examined);
    Expect("no room", [] { return UuidGet("", 1); }, 1, examined);
}

TEST(RAIDUUIDGet, BadArgumentsSetACodeAndRunNothing)
{
    IdleCall(MachineWithMirror(), [] {
        char szUuid[64] = "before";
        EXPECT_FAILS(RAIDUUIDGet(nullptr, szUuid, sizeof(szUuid)), -1, ERR_BAD_PARAMETER);
        EXPECT_FAILS(RAIDUUIDGet("/dev/md2", nullptr, sizeof(szUuid)), -1, ERR_BAD_PARAMETER);
        for (const int cbBuf : {0, -1, INT_MIN}) {
            EXPECT_FAILS(RAIDUUIDGet("/dev/md2", szUuid, cbBuf), -1, ERR_BAD_PARAMETER);
        }
        EXPECT_STREQ(szUuid, "before");
    });
}

const STEP NO_MD2 = {
    "<15>raid_info.cpp:# Failed to open /dev/md2, errno=No such file or directory"};
const STEP NO_INFO = {"<11>raid_remove.cpp:# Failed to get RAID info [/dev/md2], ret = -1"};

TEST(RAIDUUIDGet, FailsWithoutAnArrayMembersOrASuperblock)
{
    const std::string szBlank =
        "<11>raid_remove.cpp:# Disk [/dev/sdb3] in RAID [/dev/md2] has no RAID superblock, ret=";
    MACHINE inactive = MachineWithMirror();
    inactive.arrays[0].errnoInfo = ENODEV;
    MACHINE empty = MachineMake();
    MachineMdAdd(empty, {.nMd = 2});
    Expect("no array", UuidFail, -1, {NO_MD2, NO_INFO}, MachineMake(), ERR_OPEN_FAILED);
    // The driver's "no such device" ends up as a plain failure.
    Expect("inactive", UuidFail, -1,
           {{"<15>raid_info.cpp:# Failed to ioctl for raid status, errno=No such device"},
            {"<15>raid_info.cpp:# Failed to ioctl for raid status, errno=0X8000"},
            NO_INFO},
           inactive, ERR_SYSCALL_FAILED);
    Expect("no members", UuidFail, -1, {}, empty, ERR_NO_MEMBER_DISK);
    Expect("a blank member", UuidFail, -1, {ExaminedBlank("sdb3"), {szBlank + "0"}});
    Expect("a broken report", UuidFail, -1,
           {{"/sbin/mdadm -E /dev/sdb3", {.szOut = "Version : none\n"}},
            {"<11>raid_superblock.cpp:# bad version format: 'none'."},
            {szBlank + "-1"}});
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
    MACHINE machine =
        MachineWithDisks({"sdb", "sda", "isdc", "nvme0n1", "mmcblk0", "vda", "xvda"}, 4);
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
    Expect("seven disks", [&body] { return MapFill(body); }, 0, steps, machine);
}

TEST(RAIDUUIDHashForRemoveGet, LeavesOutWhatHasNoSuperblock)
{
    const auto body = [](const NLIBHASH *pMap) {
        EXPECT_EQ(KeysOf(pMap), "/dev/sda6\n/dev/sda5\n"); // slots 2 and 17
        EXPECT_STREQ(NLIBCHashGet(pMap, "/dev/sda5"), ""); // a report, and no UUID in it
        EXPECT_STREQ(NLIBCHashGet(pMap, "/dev/sda6"), UUID_MD2);
    };
    Expect(
        "four reports", [&body] { return MapFill(body); }, 0,
        {ExaminedBlank("sda3"),
         {"/sbin/mdadm -E /dev/sda4",
          {.szOut = "UUID : half read\nDevice Role : Journal\nUUID : never\n"}},
         {"<11>raid_superblock.cpp:# bad device order format: 'Journal'."},
         {"/sbin/mdadm -E /dev/sda5", {.szOut = "   MBR Magic : aa55\n"}},
         Examined("sda6", UUID_MD2)},
        MachineWithDisks({"sda"}, 6));
}

TEST(RAIDUUIDHashForRemoveGet, AddsToTheMapAndFollowsIt)
{
    MACHINE machine = MachineWithDisks({"sda", "sdb", "sdc", "sdd", "sde"}, 8);
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
    const auto refused = [] {
        PNLIBHASH pMap = nullptr;
        const int result = RAIDUUIDHashForRemoveGet(&pMap);
        EXPECT_EQ(pMap, nullptr);
        return result;
    };
    Expect("a map that refuses a pair", refused, 0,
           {Examined("sda3", UUID_MD2), Examined("sdb3", UUID_MD2)});
    Expect("no partitions", MapFillNothing, 0, {},
           WithFile(MachineMake(), "/proc/partitions", "\n"));
    Expect("no list of the kernel", MapFillNothing, -1,
           {{"<11>partition_enum.cpp:# Failed to read line of /proc/partitions, errno=0x900"},
            {"<11>raid_remove.cpp:# Fail to enum partition path"}},
           Without(MachineMake(), "/proc/partitions"), ERR_OPEN_FAILED);
}

// ---- cleaning ----------------------------------------------------------------------------------

long long CleanBy(const char *szUuid, PNLIBHASH pMap)
{
    const RAID_INFO info = {};
    return RAIDCleanSuperblock(&info, szUuid, pMap);
}

long long Clean()
{
    return CleanBy(UUID_MD2, nullptr);
}

// The home slots of sda3, sdb3, ... sdp3 are 16, 17, ... 31, and the last is slot 0 of 31.
TEST(RAIDCleanSuperblock, WipesInTheOrderOfTheMap)
{
    const std::vector<std::string> disks = {"sda", "sdb", "sdo", "sdp", "sdq"};
    STEPS steps;
    for (const std::string &szDisk : disks) {
        steps.push_back(Examined(szDisk + "3", UUID_MD2));
    }
    Expect("five disks", Clean, 0,
           steps + Wiped("sdp3") + Wiped("sdq3") + Wiped("sda3") + Wiped("sdb3") + Wiped("sdo3"),
           MachineWithDisks(disks, 3));
}

// Twenty-five members: the table has grown to 119 slots, and the order is that of the new table.
TEST(RAIDCleanSuperblock, WipesEveryMemberOfALargeArray)
{
    constexpr int ORDER[] = {15, 25, 11, 21, 18, 14, 24, 10, 20, 17, 27, 13, 23,
                             3,  4,  26, 6,  5,  8,  7,  16, 9,  12, 22, 19};
    MACHINE machine = MachineWithDisks({"sda"}, 27);
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
    Expect(
        "six UUIDs", [] { return CleanBy("aa:bb", nullptr); }, 0,
        STEPS{Examined("sda3", "aa:bb"), Examined("sda4", "aa:b"), Examined("sda5", "aa:bbb"),
              Examined("sda6", "AA:BB"), Examined("sda7", ""),
              Examined("sda8", "aa:bb (local to host box)")} +
            Wiped("sda8") + Wiped("sda3"), // slots 3 and 16
        MachineWithDisks({"sda"}, 8));
}

TEST(RAIDCleanSuperblock, AnEmptyUuidIsAValueLikeAnyOther)
{
    Expect(
        "no UUID", [] { return CleanBy("", nullptr); }, 0,
        STEPS{Examined("sda3", UUID_MD2),
              {"/sbin/mdadm -E /dev/sda4", {.szOut = "   MBR Magic : aa55\n"}},
              ExaminedBlank("sda5")} +
            Wiped("sda4"),
        MachineWithDisks({"sda"}, 5));
}

// Slots 1, 16 and 17: the second of three.
TEST(RAIDCleanSuperblock, AFailedWipeLeavesTheLaterOnesUntouched)
{
    Expect(
        "the second fails", Clean, -1,
        STEPS{Examined("sda3", UUID_MD2), Examined("sda4", UUID_MD2), Examined("sda5", UUID_MD2)} +
            Wiped("sda4") + WipeFailed("sda3", {.szErr = "mdadm: busy\n", .status = 1}),
        MachineWithDisks({"sda"}, 5));
    EXPECT_EQ(OperationErrors(),
              "Nov 05 01:02:03 command=\"/sbin/mdadm --zero-superblock /dev/sda3\" "
              "Error=\"mdadm: busy \"\n");
}

TEST(RAIDCleanSuperblock, TakesTheCallersMapAndLeavesItToHim)
{
    const auto cleanBy = [] {
        PNLIBHASH pMap = MapOf({{"/dev/sda3", UUID_MD3}, {"/dev/sdb3", UUID_MD2}});
        const long long result = CleanBy(UUID_MD2, pMap);
        EXPECT_EQ(KeysOf(pMap), "/dev/sda3\n/dev/sdb3\n");
        NLIBCHashFree(pMap);
        return result;
    };
    const auto cleanByEmpty = [] {
        PNLIBHASH pMap = MapOf({});
        const long long result = CleanBy(UUID_MD2, pMap);
        NLIBCHashFree(pMap);
        return result;
    };
    Expect("a map of two", cleanBy, 0, Wiped("sdb3"));
    Expect("an empty map", cleanByEmpty, 0, {});
}

// A map or list that cannot be had, and what says so.
void ExpectNoMemory(const char *szFault, const std::function<long long()> &call,
                    const MACHINE_FAULT &fault, const char *szTold)
{
    Expect(szFault, call, -1, {{szFault}, {std::string("<11>raid_remove.cpp:# Fail to ") + szTold}},
           WithFault(MachineWithMirror(), fault), ERR_OUT_OF_MEMORY);
}

TEST(RAIDCleanSuperblock, FailsWhenListOrMapCannotBeMadeOrFilled)
{
    Expect("no partitions", Clean, -1,
           {{"<11>partition_enum.cpp:# There's no line in /proc/partitions"},
            {"<11>raid_remove.cpp:# Fail to enum partition path"},
            {"<11>raid_remove.cpp:# Fail to get RAID UUID hash"}},
           WithFile(MachineMake(), "/proc/partitions", ""));
    ExpectNoMemory("fault malloc 1", Clean, {.szFunction = "malloc"}, "alloc RAID UUID list");
    ExpectNoMemory("fault calloc 1", Clean, {.szFunction = "calloc"}, "alloc RAID UUID hash");

    PNLIBHASH pMap = MapOf({{std::string(300, 'a'), UUID_MD2}, {std::string(300, 'b'), UUID_MD2}});
    ExpectNoMemory(
        "fault malloc 1", [&pMap] { return RAIDUUIDHashForRemoveGet(&pMap); },
        {.szFunction = "malloc"}, "alloc RAID UUID list");
    // Keys that do not fit; the first is the list itself.
    ExpectNoMemory(
        "fault malloc 2", [pMap] { return CleanBy(UUID_MD2, pMap); },
        {.szFunction = "malloc", .nCall = 2}, "get hash key list");
    EXPECT_EQ(pMap->nEntry, 2);
    NLIBCHashFree(pMap);
}

// ---- removing ----------------------------------------------------------------------------------

// What a mirror's removal does, when its record has this UUID.
void ExpectRemoval(const char *szName, const STEPS &steps, const std::string &szUuid = "",
                   int result = 0, const MACHINE &machine = MachineWithMirror(),
                   u32 code = OLD_CODE)
{
    const RAID_INFO info = RecordOf("/dev/md2", szUuid);
    Expect(szName, [&info] { return RAIDRemoveByInfo(&info); }, result, steps, machine, code);
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
    Expect("for the UUID alone", call, 0,
           STEPS{Examined("sdb3", UUID_MD2), {STOP_MD2}, CLEAN_TOLD} + Wiped("sdz9"));
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
    ExpectRemoval("an array that does not run", {NO_MD2, NO_INFO, {STOP_MD2}}, "", 0,
                  MachineWithDisks({"sda"}, 3), ERR_OPEN_FAILED);
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
    ExpectRemoval("two arrays",
                  STEPS{{STOP_MD2},
                        CLEAN_TOLD,
                        Examined("sda3", UUID_MD2),
                        Examined("sda4", UUID_MD3),
                        Examined("sda5", UUID_MD2),
                        Examined("sdb3", UUID_MD2),
                        Examined("sdb4", UUID_MD3),
                        Examined("sdb5", UUID_MD2)} +
                      Wiped("sda3") + Wiped("sda5") + Wiped("sdb3") + Wiped("sdb5"),
                  UUID_MD2, 0, MachineWithDisks({"sda", "sdb"}, 5));
}

} // namespace
