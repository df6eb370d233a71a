// SPDX-License-Identifier: MIT
#include "nurostoragecore/raid_add.h"

#include "nurocore/error.h"
#include "nurostoragecore/raid_info.h"
#include "steps.h"

#include <cerrno>
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

constexpr char ADD[] = "/sbin/mdadm /dev/md2 -a /dev/sdc3";
constexpr char GROW[] = "/sbin/mdadm --grow /dev/md2 -a /dev/sdc3";

void ExpectAdd(const char *szName, const MACHINE &machine, int result, const STEPS &steps,
               u32 code = OLD_CODE)
{
    (void)ExpectCall(
        {szName, machine, [] { return RAIDAdd("/dev/md2", "/dev/sdc3"); }, result, code, steps});
}

TEST(RaidAdd, AddsToArraysWithRedundancyAndGrowsALinearOne)
{
    for (const int level : {1, 5, 6, 10}) {
        ExpectAdd(std::to_string(level).c_str(), MachineWithArray(level), 0, {{ADD}});
    }
    ExpectAdd("linear", MachineWithArray(-1), 0, {{GROW}});
}

TEST(RaidAdd, TellsTheCommandThatFails)
{
    ExpectAdd("linear", MachineWithArray(-1), -1,
              {{GROW, {.status = 2}},
               {"<11>raid_add.cpp:# Failed to '/sbin/mdadm --grow /dev/md2 -a /dev/sdc3', "
                "ret = 512"}});
    ExpectAdd("busy", MachineWithArray(5), -1,
              {{ADD, {.szErr = "busy\n", .status = 1}},
               {"<11>raid_add.cpp:# Failed to '/sbin/mdadm /dev/md2 -a /dev/sdc3', ret = 256"}});
    EXPECT_EQ(MachineFileRead("/var/log/space_operation_error.log"),
              "Nov 05 01:02:03 command=\"/sbin/mdadm /dev/md2 -a /dev/sdc3\" Error=\"busy \"\n");
    // The code is the runner's last one: without a stream there is nothing to keep of it.
    ExpectAdd("no process", WithFault(MachineWithArray(1), {.szFunction = "fork"}), -1,
              {{"fault fork 1"},
               {"<11>raid_add.cpp:# Failed to '/sbin/mdadm /dev/md2 -a /dev/sdc3', ret = -1"}},
              ERR_BAD_PARAMETER);
}

// A disk's path may be longer than the text that the log has room for; the command gets all of it.
TEST(RaidAdd, CutsTheCommandInTheLogAlone)
{
    const std::string szDisk = "/dev/" + std::string(600, 'x');
    const std::string szCommand = "/sbin/mdadm /dev/md2 -a " + szDisk;
    (void)ExpectCall(
        {"a long path",
         MachineWithArray(1),
         [&szDisk] { return RAIDAdd("/dev/md2", szDisk.c_str()); },
         -1,
         OLD_CODE,
         {{szCommand, {.status = 1}},
          {"<11>raid_add.cpp:# Failed to '" + szCommand.substr(0, 511) + "', ret = 256"}}});
}

TEST(RaidAdd, RefusesOtherLevels)
{
    const STEP unknown = {"<11>raid_add.cpp:# Bad raid level to add disk: 0"};
    ExpectAdd("0", MachineWithArray(0), -1, {{"<11>raid_add.cpp:# Bad raid level to add disk: 1"}});
    ExpectAdd("4", MachineWithArray(4), -1,
              {{"<15>raid_info.cpp:# Not supported RAID level: 4"}, unknown});
    ExpectAdd("-4", MachineWithArray(-4), -1,
              {{"<15>raid_info.cpp:# Not supported RAID level: -4"}, unknown});
}

TEST(RaidAdd, StopsWithoutAnArray)
{
    const STEP told = {"<11>raid_add.cpp:# Failed to get RAID '/dev/md2' info. Can not add disk "
                       "into it. "};
    ExpectAdd(
        "absent", MachineMake(), -1,
        {{"<15>raid_info.cpp:# Failed to open /dev/md2, errno=No such file or directory"}, told},
        ERR_OPEN_FAILED);
    MACHINE inactive = MachineWithArray(1);
    inactive.arrays[0].errnoInfo = ENODEV;
    ExpectAdd("inactive", inactive, -1,
              {{"<15>raid_info.cpp:# Failed to ioctl for raid status, errno=No such device"},
               {"<15>raid_info.cpp:# Failed to ioctl for raid status, errno=0X8000"},
               told},
              ERR_SYSCALL_FAILED);
}

TEST(RaidAdd, RefusesNull)
{
    const RUN_RESULT result = MachineCall(MachineWithArray(1), [] {
        EXPECT_QUIET(RAIDAdd(nullptr, "/dev/sdc3"), -1);
        EXPECT_QUIET(RAIDAdd("/dev/md2", nullptr), -1);
    });
    ExpectSteps(result, 2 * STEPS{{"<11>raid_add.cpp:# Bad parameters"}});
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
        for (const u32 level : {0U, 3U, 64U, 0xFFFFFFFFU}) {
            EXPECT_QUIET(RAIDParityDiskCount(level, 4), -1);
        }
    });
    ExpectSteps(result, {{"<15>raid_add.cpp:# bad parameters: unknown raid level='0'"},
                         {"<15>raid_add.cpp:# bad parameters: unknown raid level='3'"},
                         {"<15>raid_add.cpp:# bad parameters: unknown raid level='64'"},
                         {"<15>raid_add.cpp:# bad parameters: unknown raid level='-1'"}});
}

} // namespace
