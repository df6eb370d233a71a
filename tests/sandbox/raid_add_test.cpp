// SPDX-License-Identifier: MIT
#include "nurostoragecore/raid_add.h"

#include "last_error.h"
#include "nurocore/error.h"
#include "nurostoragecore/raid_info.h"
#include "storage_machine.h"

#include <cerrno>
#include <climits>
#include <gtest/gtest.h>
#include <string>

namespace
{

MACHINE MachineWithArray(int level)
{
    MACHINE machine = MachineMake();
    MachineMdAdd(machine, {.nMd = 2, .level = level, .members = {{"sda3"}, {"sdb3"}}});
    return machine;
}

RUN_RESULT Add(const MACHINE &machine, int resultExpected, u32 codeExpected = OLD_CODE)
{
    return MachineCall(machine, [resultExpected, codeExpected] {
        EXPECT_FAILS(RAIDAdd("/dev/md2", "/dev/sdc3"), resultExpected, codeExpected);
    });
}

TEST(RaidAdd, AddsToArraysWithRedundancy)
{
    for (const int level : {1, 5, 6, 10}) {
        SCOPED_TRACE(level);
        MACHINE machine = MachineWithArray(level);
        MachineTool(machine, "/sbin/mdadm /dev/md2 -a /dev/sdc3");
        const RUN_RESULT result = Add(machine, 0);
        EXPECT_EQ(TranscriptText(result), "/sbin/mdadm /dev/md2 -a /dev/sdc3\n");
        EXPECT_EQ(LogText(result), "");
    }
}

TEST(RaidAdd, GrowsALinearArray)
{
    MACHINE machine = MachineWithArray(-1);
    MachineTool(machine, "/sbin/mdadm --grow /dev/md2 -a /dev/sdc3");
    const RUN_RESULT result = Add(machine, 0);
    EXPECT_EQ(TranscriptText(result), "/sbin/mdadm --grow /dev/md2 -a /dev/sdc3\n");
    EXPECT_EQ(LogText(result), "");
}

TEST(RaidAdd, TellsTheCommandThatFails)
{
    MACHINE machine = MachineWithArray(5);
    MachineTool(machine, "/sbin/mdadm /dev/md2 -a /dev/sdc3", {.szErr = "busy\n", .status = 1});
    EXPECT_EQ(LogText(Add(machine, -1)),
              "<11>raid_add.cpp:# Failed to '/sbin/mdadm /dev/md2 -a /dev/sdc3', ret = 256\n");
    const std::string szLog = MachineFileRead("/var/log/space_operation_error.log").value_or("");
    EXPECT_NE(szLog.find(" command=\"/sbin/mdadm /dev/md2 -a /dev/sdc3\" Error=\"busy \"\n"),
              std::string::npos)
        << szLog;

    MACHINE machineLinear = MachineWithArray(-1);
    MachineTool(machineLinear, "/sbin/mdadm --grow /dev/md2 -a /dev/sdc3", {.status = 2});
    EXPECT_EQ(LogText(Add(machineLinear, -1)),
              "<11>raid_add.cpp:# Failed to '/sbin/mdadm --grow /dev/md2 -a /dev/sdc3', "
              "ret = 512\n");
}

// The code is the runner's last one: without a stream there is nothing to keep of it.
TEST(RaidAdd, TellsACommandThatCannotBeStarted)
{
    MACHINE machine = MachineWithArray(1);
    machine.faults = {{.szFunction = "fork", .nCall = 1, .error = EAGAIN}};
    EXPECT_EQ(LogText(Add(machine, -1, ERR_BAD_PARAMETER)),
              "<11>raid_add.cpp:# Failed to '/sbin/mdadm /dev/md2 -a /dev/sdc3', ret = -1\n");
}

// A disk's path may be longer than the text that the log has room for; the command gets all of it.
TEST(RaidAdd, CutsTheCommandInTheLogAlone)
{
    const std::string szDisk = "/dev/" + std::string(600, 'x');
    MACHINE machine = MachineWithArray(1);
    MachineTool(machine, "/sbin/mdadm /dev/md2 -a " + szDisk, {.status = 1});
    const RUN_RESULT result =
        MachineCall(machine, [&szDisk] { EXPECT_EQ(RAIDAdd("/dev/md2", szDisk.c_str()), -1); });
    const std::string szCommand = "/sbin/mdadm /dev/md2 -a " + szDisk;
    EXPECT_EQ(LogText(result),
              "<11>raid_add.cpp:# Failed to '" + szCommand.substr(0, 511) + "', ret = 256\n");
}

struct LEVEL_CASE {
    int level;     // as the driver tells it
    int levelCode; // as it is logged
};

TEST(RaidAdd, RefusesOtherLevels)
{
    constexpr LEVEL_CASE CASES[] = {{0, 1}, {4, 0}, {-4, 0}};
    for (const LEVEL_CASE &row : CASES) {
        SCOPED_TRACE(row.level);
        const RUN_RESULT result = Add(MachineWithArray(row.level), -1);
        EXPECT_EQ(LogErrors(result), "<11>raid_add.cpp:# Bad raid level to add disk: " +
                                         std::to_string(row.levelCode) + "\n");
        EXPECT_EQ(TranscriptText(result), "");
    }
}

TEST(RaidAdd, StopsWithoutAnArray)
{
    constexpr char NO_ARRAY[] = "<11>raid_add.cpp:# Failed to get RAID '/dev/md2' info. Can not "
                                "add disk into it. \n";
    const RUN_RESULT absent = MachineCall(MachineMake(), [] {
        EXPECT_EQ(RAIDAdd("/dev/md2", "/dev/sdc3"), -1);
        EXPECT_EQ(NLIBCErrGet(), ERR_OPEN_FAILED);
    });
    EXPECT_EQ(LogErrors(absent), NO_ARRAY);

    MACHINE machine = MachineWithArray(1);
    machine.arrays[0].errnoInfo = ENODEV;
    const RUN_RESULT inactive = Add(machine, -1, ERR_SYSCALL_FAILED);
    EXPECT_EQ(LogErrors(inactive), NO_ARRAY);
    EXPECT_EQ(TranscriptText(inactive), "");
}

TEST(RaidAdd, RefusesNull)
{
    const RUN_RESULT result = MachineCall(MachineWithArray(1), [] {
        RecordReset();
        EXPECT_EQ(RAIDAdd(nullptr, "/dev/sdc3"), -1);
        EXPECT_EQ(RAIDAdd("/dev/md2", nullptr), -1);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
    EXPECT_EQ(LogText(result), "<11>raid_add.cpp:# Bad parameters\n"
                               "<11>raid_add.cpp:# Bad parameters\n");
    EXPECT_EQ(TranscriptText(result), "");
}

// ---- redundancy --------------------------------------------------------------------------------

struct PARITY_CASE {
    u32 level;
    int nDisks;
    int nParity;
};

TEST(RaidParity, IsCountedByLevel)
{
    constexpr PARITY_CASE CASES[] = {
        {1, 4, 0},  {32, 4, 0}, {2, 1, 0},  {2, 2, 1},  {2, 4, 3},
        {2, 0, -1}, {4, 3, 1},  {4, 12, 1}, {8, 4, 2},  {8, 12, 2},
        {16, 4, 2}, {16, 5, 2}, {16, 1, 0}, {16, 0, 0}, {16, -3, -1}, // truncated toward zero
    };
    QuietCall(MachineMake(), [&CASES] {
        for (const PARITY_CASE &row : CASES) {
            EXPECT_EQ(RAIDParityDiskCount(row.level, row.nDisks), row.nParity)
                << row.level << ' ' << row.nDisks;
        }
    });
}

TEST(RaidParity, OfAnUnknownLevelIsRefused)
{
    const RUN_RESULT result = MachineCall(MachineMake(), [] {
        RecordReset();
        EXPECT_EQ(RAIDParityDiskCount(0, 4), -1);
        EXPECT_EQ(RAIDParityDiskCount(3, 4), -1);
        EXPECT_EQ(RAIDParityDiskCount(64, 4), -1);
        EXPECT_EQ(RAIDParityDiskCount(0xFFFFFFFF, 4), -1);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
    });
    EXPECT_EQ(LogText(result), "<15>raid_add.cpp:# bad parameters: unknown raid level='0'\n"
                               "<15>raid_add.cpp:# bad parameters: unknown raid level='3'\n"
                               "<15>raid_add.cpp:# bad parameters: unknown raid level='64'\n"
                               "<15>raid_add.cpp:# bad parameters: unknown raid level='-1'\n");
}

} // namespace
