// SPDX-License-Identifier: MIT
//
// What the command layer does with values that no machine gives it. The program is linked in here,
// where its entry point is no longer the one and bears another name.
#include "arrayctl_internal.h"

#include <algorithm>
#include <cstring>
#include <gtest/gtest.h>
#include <syslog.h>
#include <unistd.h>

extern "C" int ArrayctlMain(int argc, char *argv[]);

namespace
{

RAID_DISK Member(const char *szPath, u32 state, RAID_DISK *pNext)
{
    RAID_DISK disk = {};
    (void)snprintf(disk.szPath, sizeof(disk.szPath), "%s", szPath);
    disk.state = state;
    disk.pNext = pNext;
    return disk;
}

std::string Printed(const RAID_INFO &info)
{
    testing::internal::CaptureStdout();
    ReportPrint(info);
    (void)fflush(stdout);
    return testing::internal::GetCapturedStdout();
}

RAID_INFO Info(u32 level, u32 status, u32 rebuild, u64 arraySize, RAID_DISK *pDisks)
{
    RAID_INFO info = {};
    (void)snprintf(info.szPath, sizeof(info.szPath), "/dev/md2");
    info.level = level;
    info.status = status;
    info.rebuild.state = rebuild;
    info.arraySize = arraySize;
    info.pDisks = pDisks;
    return info;
}

TEST(Report, UnknownMemberStateRepeatsTheWordBefore)
{
    RAID_DISK last = Member("/dev/sda3", 64, nullptr);
    RAID_DISK middle = Member("/dev/sdb3", 1, &last);
    RAID_DISK first = Member("/dev/sdc3", 0, &middle);
    EXPECT_EQ(Printed(Info(4, 1, 0, 1048575, &first)),
              "/dev/md2 is running, status: NORMAL, rebuilding: None\n"
              "Device level: RAID 5\n"
              "Device size: 0 MB (1048575 bytes) \n"
              "Disk: \n"
              "\t [/dev/sdc3: ]\n"
              "\t [/dev/sdb3: Normal]\n"
              "\t [/dev/sda3: Normal]\n"
              "\n");
}

TEST(Report, UnknownMemberStateRepeatsACutWordToo)
{
    RAID_DISK last = Member("/dev/sda3", 3, nullptr);
    RAID_DISK first = Member("/dev/sdb3", 4, &last);
    EXPECT_EQ(Printed(Info(2, 4, 2, 0, &first)),
              "/dev/md2 is running, status: CRASHED, rebuilding: Waiting...\n"
              "Device level: RAID 1\n"
              "Device size: 0 MB (0 bytes) \n"
              "Disk: \n"
              "\t [/dev/sdb3: Failed(Which ma]\n"
              "\t [/dev/sda3: Failed(Which ma]\n"
              "\n");
}

TEST(Report, UnknownValuesHaveNoWord)
{
    EXPECT_EQ(Printed(Info(3, 8, 3, 18446744073709551615ULL, nullptr)),
              "/dev/md2 is running, status: , rebuilding: \n"
              "Device level: \n"
              "Device size: 17592186044415 MB (18446744073709551615 bytes) \n"
              "Disk: \n"
              "\n");
}

TEST(Report, AMemberThatIsNoneIsPrintedAsSuch)
{
    RAID_DISK only = Member("/dev/sda3", 32, nullptr);
    EXPECT_EQ(Printed(Info(32, 2, 1, 1048576, &only)),
              "/dev/md2 is running, status: DEGRADE, rebuilding: Progressing...[\n"
              "Device level: JBOD\n"
              "Device size: 1 MB (1048576 bytes) \n"
              "Disk: \n"
              "\t [/dev/sda3: None]\n"
              "\n");
}

TEST(SystemRaidCreate, NeedsADeviceAndMembers)
{
    EXPECT_EQ(SystemRaidCreate(nullptr, 1, 4, "/dev/sda1 "), -1);
    EXPECT_EQ(SystemRaidCreate("/dev/md0", 1, 4, nullptr), -1);
}

// What is logged as an error meanwhile, with its line number masked.
std::string ErrorLogged(void (*pBody)())
{
    constexpr char DIGITS[] = "0123456789";
    openlog("tool", LOG_PERROR, LOG_USER);
    const int maskBefore = setlogmask(LOG_MASK(LOG_ERR));
    testing::internal::CaptureStderr();
    pBody();
    std::string szLog = testing::internal::GetCapturedStderr();
    (void)setlogmask(maskBefore);
    openlog(nullptr, 0, LOG_USER);
    const size_t iNumber = std::min(szLog.find_first_of(DIGITS), szLog.size());
    return szLog.replace(iNumber, strspn(szLog.c_str() + iNumber, DIGITS), "#");
}

TEST(DiskFormatType, WithoutANameThereIsNothingToDo)
{
    EXPECT_EQ(ErrorLogged([] { EXPECT_EQ(DiskFormatTypeGet(nullptr, 8), 0); }),
              "tool: arrayctl.cpp:# Null List Error\n");
}

// A disk that was left alone has no child; if it had one, the child would not touch it.
TEST(Partitioning, OfADiskThatIsLeftAloneFails)
{
    for (const int type : {0, 3, 5, 255}) {
        EXPECT_EQ(PartitionInChild("no_such_disk", type, 8), 255) << type;
    }
}

pid_t ChildWithStatus(int status)
{
    const pid_t pid = fork();
    if (pid == 0) {
        _exit(status);
    }
    return pid;
}

// A disk that finds no place in its list ends the collecting; the disk's kind tells the list.
TEST(FormatTypes, ADiskThatFindsNoPlaceEndsTheCollecting)
{
    for (const int type : {FORMAT_NONE, FORMAT_WIPE, FORMAT_KEEP_DATA, FORMAT_UNRECOGNISED}) {
        PNLIBSZLIST pAll = NLIBCSzListAlloc(0);
        ASSERT_EQ(NLIBCSzListPush(&pAll, "sda"), 0);
        FORMAT_LISTS lists = {.pAll = pAll, .pKeepData = nullptr, .pFormatAll = nullptr};
        const DISK_CHILD child = {.pid = ChildWithStatus(type), .type = FORMAT_NONE};
        const bool fPushed = type == FORMAT_WIPE || type == FORMAT_KEEP_DATA;
        EXPECT_EQ(FormatTypesCollect(&child, lists), fPushed ? -1 : 0) << type;
        NLIBCSzListFree(pAll);
    }
}

// The option goes by the length of the path that is given.
TEST(SystemRaidCreate, OldSuperblocksAreForTheSystemArrays)
{
    EXPECT_STREQ(MetadataOption("/dev/md0"), "-e 0.9");
    EXPECT_STREQ(MetadataOption("/dev/md1"), "-e 0.9");
    EXPECT_STREQ(MetadataOption("/dev/md"), "-e 0.9");
    EXPECT_STREQ(MetadataOption("/dev/md2"), "");
    EXPECT_STREQ(MetadataOption("/dev/md10"), "");
}

TEST(EntryPoint, WithoutAnyArgumentItPrintsTheUsage)
{
    testing::internal::CaptureStdout();
    EXPECT_EQ(ArrayctlMain(0, nullptr), 1);
    EXPECT_EQ(testing::internal::GetCapturedStdout(),
              "usage:\n\tarrayctl destroy <RAID ID> \n\tarrayctl status <RAID ID> \n\tarrayctl "
              "newvol \n\tarrayctl initsys \n\tarrayctl initsys-dd \n");
}

} // namespace
