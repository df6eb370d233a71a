// SPDX-License-Identifier: MIT
//
// What the command prints; arrays that cannot be queried are tested with the query.
#include "steps.h"

#include <gtest/gtest.h>

namespace
{

struct REPORT {
    std::string szLevel = "RAID 1";
    std::string szStatus = "NORMAL";
    std::string szRebuild = "None";
    std::string szSize = "1024 MB (1073741824 bytes)";
    std::string szMembers = "";
};

std::string TextOf(const REPORT &report)
{
    return "/dev/md2 is running, status: " + report.szStatus + ", rebuilding: " + report.szRebuild +
           "\nDevice level: " + report.szLevel + "\nDevice size: " + report.szSize + " \nDisk: \n" +
           report.szMembers + "\n";
}

// What is reported of an array md2.
void ExpectReport(MACHINE_MD md, const REPORT &report, const STEPS &steps = {})
{
    md.nMd = 2;
    MACHINE machine = MachineMake();
    MachineMdAdd(machine, md);
    (void)ExpectRun({.szName = "md2",
                     .machine = machine,
                     .arguments = {"status", "2"},
                     .szOut = TextOf(report),
                     .steps = steps});
}

} // namespace

TEST(Status, AHealthyMirrorOfTwo)
{
    MACHINE machine = MachineMake();
    MachineMdAdd(machine,
                 {.nMd = 0,
                  .majorVersion = 0,
                  .minorVersion = 90,
                  .level = 1,
                  .size = 2097152,
                  .arraySize = 2147483648,
                  .members = {{"sda1", "in_sync\n", "0\n"}, {"sdb1", "in_sync\n", "1\n"}}});
    ExpectRuns({{.szName = "md0",
                 .machine = machine,
                 .arguments = {"status", "0"},
                 .szOut = "/dev/md0 is running, status: NORMAL, rebuilding: None\n"
                          "Device level: RAID 1\n"
                          "Device size: 2048 MB (2147483648 bytes) \n"
                          "Disk: \n"
                          "\t [/dev/sdb1: Normal]\n"
                          "\t [/dev/sda1: Normal]\n"
                          "\n"}});
}

TEST(Status, EveryLevelHasItsWord)
{
    ExpectReport({.level = 0}, {.szLevel = "RAID 0"});
    ExpectReport({.level = 1}, {.szLevel = "RAID 1"});
    ExpectReport({.level = 5}, {.szLevel = "RAID 5"});
    ExpectReport({.level = 6}, {.szLevel = "RAID 6"});
    ExpectReport({.level = 10}, {.szLevel = "RAID_10"});
    ExpectReport({.level = -1}, {.szLevel = "JBOD"});
}

TEST(Status, ALevelWithoutAWordIsEmptyAndLogged)
{
    for (const int level : {2, 3, 4, 7, 8, 9, 11, 100, -2, -4, -1000000}) {
        ExpectReport({.level = level}, {.szLevel = ""},
                     {{"<15>raid_info.cpp:# Not supported RAID level: " + std::to_string(level)}});
    }
}

TEST(Status, EveryHealthHasItsWord)
{
    ExpectReport({.health = 0}, {.szStatus = "NORMAL"});
    ExpectReport({.health = 1}, {.szStatus = "DEGRADE"});
    ExpectReport({.health = 2}, {.szStatus = "CRASHED"});
}

TEST(Status, TheProgressIsCutBeforeItsNumbers)
{
    const REPORT progressing = {.szRebuild = "Progressing...["};
    ExpectReport({.activity = 1, .done = 123, .total = 456}, progressing);
    ExpectReport({.activity = 7, .done = UINT64_MAX, .total = UINT64_MAX}, progressing);
    ExpectReport({.activity = 1ULL << 32, .done = 1ULL << 32, .total = 0}, progressing);
}

TEST(Status, AResyncThatHasDoneNothingWaits)
{
    ExpectReport({.activity = 1, .done = 0, .total = 456}, {.szRebuild = "Waiting..."});
}

TEST(Status, WithoutActivityNumbersMeanNothing)
{
    ExpectReport({.activity = 0, .done = 123, .total = 456}, {.szRebuild = "None"});
}

TEST(Status, EveryMemberStateHasItsWord)
{
    ExpectReport({.level = 5,
                  .health = 1,
                  .members = {{"sda3", "in_sync\n", "0\n"},
                              {"sdb3", "faulty\n", "none\n"},
                              {"sdc3", "error\n", "1\n"},
                              {"sdd3", "spare\n", "2\n"},
                              {"sde3", "spare\n", "none\n"}}},
                 {.szLevel = "RAID 5",
                  .szStatus = "DEGRADE",
                  .szMembers = "\t [/dev/sde3: Spare Disk]\n"
                               "\t [/dev/sdd3: Rebuilding]\n"
                               "\t [/dev/sdc3: Failed(Which ma]\n"
                               "\t [/dev/sdb3: Failed]\n"
                               "\t [/dev/sda3: Normal]\n"});
}

TEST(Status, AMemberStateThatNobodyKnowsCountsAsNormal)
{
    ExpectReport({.members = {{"sda3", "journal\n"}, {"sdb3", "\n"}}},
                 {.szMembers = "\t [/dev/sdb3: Normal]\n\t [/dev/sda3: Normal]\n"});
}

TEST(Status, MembersComeInReverseOrderOfTheirNames)
{
    ExpectReport({.members = {{"sdb3"}, {"sda10"}, {"sdaa3"}, {"sda3"}, {"loop0"}}},
                 {.szMembers = "\t [/dev/sdb3: Normal]\n"
                               "\t [/dev/sdaa3: Normal]\n"
                               "\t [/dev/sda3: Normal]\n"
                               "\t [/dev/sda10: Normal]\n"
                               "\t [/dev/loop0: Normal]\n"});
}

TEST(Status, TheSizeIsInWholeMebibytesAndBytes)
{
    ExpectReport({.arraySize = 0}, {.szSize = "0 MB (0 bytes)"});
    ExpectReport({.arraySize = 1048575}, {.szSize = "0 MB (1048575 bytes)"});
    ExpectReport({.arraySize = 1048576}, {.szSize = "1 MB (1048576 bytes)"});
    ExpectReport({.arraySize = 4294967295}, {.szSize = "4095 MB (4294967295 bytes)"});
    ExpectReport({.arraySize = 4294967296}, {.szSize = "4096 MB (4294967296 bytes)"});
    ExpectReport({.arraySize = 48000000000000}, {.szSize = "45776367 MB (48000000000000 bytes)"});
    ExpectReport({.arraySize = UINT64_MAX},
                 {.szSize = "17592186044415 MB (18446744073709551615 bytes)"});
}

TEST(Status, AMemberThatCannotBeReadIsLeftOut)
{
    // The slot file that does not open leaves the code as the other member's failure left it.
    const std::string szMember = " /sys/block/md2/md/dev-sd";
    const std::string szTold = "<15>raid_disk.cpp:# Failed to ";
    ExpectReport({.members = {{"sda3"}, {"sdb3", NO_FILE, "1\n"}, {"sdc3", "in_sync\n", NO_FILE}}},
                 {.szMembers = "\t [/dev/sda3: Normal]\n"},
                 {{szTold + "fopen" + szMember + "b3/state, errno=No such file or directory"},
                  {szTold + "get status from" + szMember + "b3/state, errno=0X900"},
                  {szTold + "get status from" + szMember + "b3, errno=0X900"},
                  {szTold + "create disk info from" + szMember + "b3 ,errno=0X900"},
                  {"<11>raid_disk.cpp:# failed to fopen" + szMember +
                   "c3/slot, errno=No such file or directory"},
                  {szTold + "get slot of" + szMember + "c3, errno=0X900"},
                  {szTold + "create disk info from" + szMember + "c3 ,errno=0X900"}});
}

TEST(Status, AMissingArrayIsNotFound)
{
    ExpectRuns({{.szName = "md7",
                 .arguments = {"status", "7"},
                 .szOut = "RAID /dev/md7 is not found\n",
                 .status = 1,
                 .steps = {{"<15>raid_info.cpp:# Failed to open /dev/md7, "
                            "errno=No such file or directory"}}}});
}
