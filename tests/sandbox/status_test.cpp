// SPDX-License-Identifier: MIT
#include "sandbox.h"

#include <gtest/gtest.h>

#include <cerrno>

namespace
{

RUN_RESULT StatusOf(const MACHINE_MD &md)
{
    MACHINE machine = MachineMake();
    MachineMdAdd(machine, md);
    return MachineRun(machine, {"status", std::to_string(md.nMd)});
}

void ExpectReport(const MACHINE_MD &md, const std::string &szReport)
{
    const RUN_RESULT result = StatusOf(md);
    EXPECT_EQ(result.szOut, szReport);
    EXPECT_EQ(result.szErr, "");
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(OrderText(result), "");
}

void ExpectNotFound(const MACHINE_MD &md, const std::string &szLog)
{
    const RUN_RESULT result = StatusOf(md);
    EXPECT_EQ(result.szOut, "RAID /dev/md" + std::to_string(md.nMd) + " is not found\n");
    EXPECT_EQ(result.szErr, "");
    EXPECT_EQ(result.status, 1);
    EXPECT_EQ(LogText(result), szLog);
    EXPECT_EQ(TranscriptText(result), "");
}

std::string ReportWith(const std::string &szLevel, const std::string &szStatus = "NORMAL",
                       const std::string &szRebuild = "None")
{
    return "/dev/md2 is running, status: " + szStatus + ", rebuilding: " + szRebuild +
           "\n"
           "Device level: " +
           szLevel +
           "\n"
           "Device size: 1024 MB (1073741824 bytes) \n"
           "Disk: \n"
           "\n";
}

} // namespace

TEST(Status, AHealthyMirrorOfTwo)
{
    ExpectReport({.nMd = 0,
                  .majorVersion = 0,
                  .minorVersion = 90,
                  .level = 1,
                  .size = 2097152,
                  .arraySize = 2147483648,
                  .members = {{"sda1", "in_sync\n", "0\n"}, {"sdb1", "in_sync\n", "1\n"}}},
                 "/dev/md0 is running, status: NORMAL, rebuilding: None\n"
                 "Device level: RAID 1\n"
                 "Device size: 2048 MB (2147483648 bytes) \n"
                 "Disk: \n"
                 "\t [/dev/sdb1: Normal]\n"
                 "\t [/dev/sda1: Normal]\n"
                 "\n");
}

TEST(Status, EveryLevelHasItsWord)
{
    ExpectReport({.nMd = 2, .level = 0}, ReportWith("RAID 0"));
    ExpectReport({.nMd = 2, .level = 1}, ReportWith("RAID 1"));
    ExpectReport({.nMd = 2, .level = 5}, ReportWith("RAID 5"));
    ExpectReport({.nMd = 2, .level = 6}, ReportWith("RAID 6"));
    ExpectReport({.nMd = 2, .level = 10}, ReportWith("RAID_10"));
    ExpectReport({.nMd = 2, .level = -1}, ReportWith("JBOD"));
}

TEST(Status, ALevelWithoutAWordIsEmptyAndLogged)
{
    for (const int level : {2, 3, 4, 7, 8, 9, 11, 100, -2, -4, -1000000}) {
        const RUN_RESULT result = StatusOf({.nMd = 2, .level = level});
        EXPECT_EQ(result.szOut, ReportWith(""));
        EXPECT_EQ(result.status, 0);
        EXPECT_EQ(LogText(result),
                  "<15>raid_info.cpp:# Not supported RAID level: " + std::to_string(level) + "\n");
    }
}

TEST(Status, EveryHealthHasItsWord)
{
    ExpectReport({.nMd = 2, .health = 0}, ReportWith("RAID 1", "NORMAL"));
    ExpectReport({.nMd = 2, .health = 1}, ReportWith("RAID 1", "DEGRADE"));
    ExpectReport({.nMd = 2, .health = 2}, ReportWith("RAID 1", "CRASHED"));
}

TEST(Status, TheProgressIsCutBeforeItsNumbers)
{
    ExpectReport({.nMd = 2, .activity = 1, .done = 123, .total = 456},
                 ReportWith("RAID 1", "NORMAL", "Progressing...["));
    ExpectReport({.nMd = 2, .activity = 7, .done = UINT64_MAX, .total = UINT64_MAX},
                 ReportWith("RAID 1", "NORMAL", "Progressing...["));
    ExpectReport({.nMd = 2, .activity = 1ULL << 32, .done = 1ULL << 32, .total = 0},
                 ReportWith("RAID 1", "NORMAL", "Progressing...["));
}

TEST(Status, AResyncThatHasDoneNothingWaits)
{
    ExpectReport({.nMd = 2, .activity = 1, .done = 0, .total = 456},
                 ReportWith("RAID 1", "NORMAL", "Waiting..."));
}

TEST(Status, WithoutActivityNumbersMeanNothing)
{
    ExpectReport({.nMd = 2, .activity = 0, .done = 123, .total = 456},
                 ReportWith("RAID 1", "NORMAL", "None"));
}

TEST(Status, EveryMemberStateHasItsWord)
{
    ExpectReport({.nMd = 3,
                  .level = 5,
                  .health = 1,
                  .members = {{"sda3", "in_sync\n", "0\n"},
                              {"sdb3", "faulty\n", "none\n"},
                              {"sdc3", "error\n", "1\n"},
                              {"sdd3", "spare\n", "2\n"},
                              {"sde3", "spare\n", "none\n"}}},
                 "/dev/md3 is running, status: DEGRADE, rebuilding: None\n"
                 "Device level: RAID 5\n"
                 "Device size: 1024 MB (1073741824 bytes) \n"
                 "Disk: \n"
                 "\t [/dev/sde3: Spare Disk]\n"
                 "\t [/dev/sdd3: Rebuilding]\n"
                 "\t [/dev/sdc3: Failed(Which ma]\n"
                 "\t [/dev/sdb3: Failed]\n"
                 "\t [/dev/sda3: Normal]\n"
                 "\n");
}

TEST(Status, AMemberStateThatNobodyKnowsCountsAsNormal)
{
    const RUN_RESULT result =
        StatusOf({.nMd = 2, .members = {{"sda3", "journal\n"}, {"sdb3", "\n"}}});
    EXPECT_NE(result.szOut.find("\t [/dev/sdb3: Normal]\n\t [/dev/sda3: Normal]\n\n"),
              std::string::npos)
        << result.szOut;
}

TEST(Status, MembersComeInReverseOrderOfTheirNames)
{
    const RUN_RESULT result =
        StatusOf({.nMd = 2, .members = {{"sdb3"}, {"sda10"}, {"sdaa3"}, {"sda3"}, {"loop0"}}});
    EXPECT_NE(result.szOut.find("Disk: \n"
                                "\t [/dev/sdb3: Normal]\n"
                                "\t [/dev/sdaa3: Normal]\n"
                                "\t [/dev/sda3: Normal]\n"
                                "\t [/dev/sda10: Normal]\n"
                                "\t [/dev/loop0: Normal]\n"
                                "\n"),
              std::string::npos)
        << result.szOut;
}

struct SIZE_CASE {
    std::uint64_t cb;
    const char *szLine;
};

TEST(Status, TheSizeIsInWholeMebibytesAndBytes)
{
    for (const SIZE_CASE &size :
         {SIZE_CASE{0, "Device size: 0 MB (0 bytes) \n"},
          SIZE_CASE{1048575, "Device size: 0 MB (1048575 bytes) \n"},
          SIZE_CASE{1048576, "Device size: 1 MB (1048576 bytes) \n"},
          SIZE_CASE{4294967295, "Device size: 4095 MB (4294967295 bytes) \n"},
          SIZE_CASE{4294967296, "Device size: 4096 MB (4294967296 bytes) \n"},
          SIZE_CASE{48000000000000, "Device size: 45776367 MB (48000000000000 bytes) \n"},
          SIZE_CASE{UINT64_MAX,
                    "Device size: 17592186044415 MB (18446744073709551615 bytes) \n"}}) {
        const RUN_RESULT result = StatusOf({.nMd = 2, .arraySize = size.cb});
        EXPECT_NE(result.szOut.find(size.szLine), std::string::npos) << result.szOut;
        EXPECT_EQ(result.status, 0);
    }
}

TEST(Status, AMemberThatCannotBeReadIsLeftOut)
{
    const RUN_RESULT result =
        StatusOf({.nMd = 2,
                  .members = {{"sda3"}, {"sdb3", NO_FILE, "1\n"}, {"sdc3", "in_sync\n", NO_FILE}}});
    EXPECT_NE(result.szOut.find("Disk: \n\t [/dev/sda3: Normal]\n\n"), std::string::npos)
        << result.szOut;
    EXPECT_EQ(result.status, 0);
    // The slot file that does not open leaves the code as the other member's failure left it.
    EXPECT_EQ(LogText(result),
              "<15>raid_disk.cpp:# Failed to fopen /sys/block/md2/md/dev-sdb3/state, "
              "errno=No such file or directory\n"
              "<15>raid_disk.cpp:# Failed to get status from /sys/block/md2/md/dev-sdb3/state, "
              "errno=0X900\n"
              "<15>raid_disk.cpp:# Failed to get status from /sys/block/md2/md/dev-sdb3, "
              "errno=0X900\n"
              "<15>raid_disk.cpp:# Failed to create disk info from /sys/block/md2/md/dev-sdb3 "
              ",errno=0X900\n"
              "<11>raid_disk.cpp:# failed to fopen /sys/block/md2/md/dev-sdc3/slot, "
              "errno=No such file or directory\n"
              "<15>raid_disk.cpp:# Failed to get slot of /sys/block/md2/md/dev-sdc3, "
              "errno=0X900\n"
              "<15>raid_disk.cpp:# Failed to create disk info from /sys/block/md2/md/dev-sdc3 "
              ",errno=0X900\n");
}

TEST(Status, AMissingArrayIsNotFound)
{
    const RUN_RESULT result =
        RunEnds(MachineMake(), {"status", "7"}, 1, "RAID /dev/md7 is not found\n");
    EXPECT_EQ(LogText(result), "<15>raid_info.cpp:# Failed to open /dev/md7, "
                               "errno=No such file or directory\n");
}

TEST(Status, AnInactiveArrayIsNotFound)
{
    ExpectNotFound({.nMd = 2, .errnoInfo = ENODEV},
                   "<15>raid_info.cpp:# Failed to ioctl for raid status, errno=No such device\n"
                   "<15>raid_info.cpp:# Failed to ioctl for raid status, errno=0X8000\n");
}

TEST(Status, AnArrayThatDoesNotAnswerIsNotFound)
{
    ExpectNotFound({.nMd = 2, .errnoInfo = EINTR},
                   "<15>raid_info.cpp:# Failed to ioctl for raid status, errno=0XA700\n");
    ExpectNotFound({.nMd = 2, .errnoSize = EIO},
                   "<15>raid_info.cpp:# Failed to ioctl for raid status, "
                   "errno=Input/output error\n"
                   "<15>raid_info.cpp:# Failed to ioctl for raid size, errno=0X8000\n");
    ExpectNotFound({.nMd = 2, .errnoSync = ENOTTY},
                   "<15>raid_info.cpp:# Failed to ioctl for sync status, "
                   "errno=Inappropriate ioctl for device\n"
                   "<15>raid_info.cpp:# Failed to get disk list for /dev/md2, errno=0X8000\n");
    ExpectNotFound({.nMd = 2, .errnoHealth = ENOTTY},
                   "<15>raid_info.cpp:# Failed to ioctl for raid status, "
                   "errno=Inappropriate ioctl for device\n"
                   "<15>raid_info.cpp:# Failed to ioctl for raid size, errno=0X8000\n");
}

TEST(Status, AHealthThatNobodyKnowsIsNotFound)
{
    for (const int health : {3, -1, 255}) {
        ExpectNotFound({.nMd = 2, .health = health},
                       "<15>raid_info.cpp:# unknown raid status, status=" + std::to_string(health) +
                           "\n"
                           "<15>raid_info.cpp:# Failed to ioctl for raid size, errno=0X8000\n");
    }
}

TEST(Status, WithoutMemoryTheArrayIsNotFound)
{
    MACHINE machine = MachineMake();
    MachineMdAdd(machine, {.nMd = 2});
    machine.faults = {{.szFunction = "calloc", .nCall = 1, .error = ENOMEM}};
    const RUN_RESULT result = RunEnds(machine, {"status", "2"}, 1, "RAID /dev/md2 is not found\n");
    EXPECT_EQ(LogText(result),
              "<15>raid_info.cpp:# Failed to calloc, errno=Cannot allocate memory\n");
}
