// SPDX-License-Identifier: MIT
//
// Machines that no factory makes, but that sysfs and the tools could show all the same.
#include "hwcontrol/disk_name.h"
#include "hwcontrol/disk_path.h"
#include "hwcontrol/disk_port.h"
#include "last_error.h"
#include "nurocore/error.h"
#include "nurostoragecore/partition_version.h"
#include "nurostoragecore/raid_disk.h"
#include "nurostoragecore/raid_info.h"
#include "nurostoragecore/raid_membership.h"
#include "nurostoragecore/raid_remove.h"
#include "nurostoragecore/raid_superblock.h"
#include "nurostoragecore/raid_system.h"
#include "nurostoragecore/space.h"
#include "storage_machine.h"

#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <string>
#include <unistd.h>

namespace
{

constexpr int UNTOUCHED = 4711;

TEST(OddMachine, AMemberWithoutANameIsNoDisk)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineFolder(machine, "/sys/block/md0/md/dev-");
    const RUN_RESULT result = MachineCall(machine, [] {
        u32 version = 0;
        EXPECT_EQ(PartitionLayoutGetMax(&version, 1), 0);
        EXPECT_EQ(version, 8U);
    });
    EXPECT_EQ(LogText(result), "<15>partition_layout.cpp:# : dont contain partition [1]\n");
}

// Only letters count, up to the first character that is none.
TEST(OddMachine, ADisksLettersEndAtWhateverIsNone)
{
    EXPECT_EQ(DiskIndexGet("sda{"), 0);
    EXPECT_EQ(DiskIndexGet("sdb`a"), 1);
    EXPECT_EQ(DiskIndexGet("/dev/sdaB"), 0);
    EXPECT_EQ(DiskIndexGet("sd~"), -1);
}

TEST(OddMachine, UnitsNeedAPlaceToBeListedIn)
{
    MachineCall(MachineWithConf(CONF_RAID), [] {
        char szUnits[8] = "x";
        EXPECT_EQ(ExternalDiskPortEnumEunit(0, nullptr, 8), -1);
        EXPECT_EQ(NLIBCErrGet(), ERR_BAD_PARAMETER);
        EXPECT_FAILS(ExternalDiskPortEnumEunit(0, szUnits, 0), -1, ERR_BAD_PARAMETER);
        EXPECT_STREQ(szUnits, "x");
    });
}

// The first list that does not fit ends it; what fitted stays.
TEST(OddMachine, AUnitThatDoesNotFitEndsTheList)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    ExpansionUnitAdd(machine, "host1", "/dev/sdga,/dev/sdgb");
    ExpansionUnitAdd(machine, "host2", "/dev/sdgc");
    MachineCall(machine, [] {
        char szUnits[12] = "";
        EXPECT_EQ(ExternalDiskPortEnumEunit(0, szUnits, 6), -1);
        EXPECT_EQ(NLIBCErrGet(), ERR_BAD_FORMAT);
        EXPECT_STREQ(szUnits, "sdga ");
    });
}

// Only a version that is still none becomes the newest.
TEST(OddMachine, AVersionThatTheCallerHasStaysWhereNoMemberIsKnown)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    PartitionedDiskAdd(machine, "sda", PLACES_FOREIGN);
    SystemArrayAdd(machine, {{"sda1"}});
    MachineCall(machine, [] {
        u32 version = 5;
        EXPECT_EQ(PartitionLayoutGetMax(&version, 1), 0);
        EXPECT_EQ(version, 5U);
    });
}

// The boot device has no partition names, so only its own superblock can tell.
TEST(OddMachine, TheBootDeviceIsAskedAsAWhole)
{
    for (const int nMd : {100, 101}) {
        MACHINE machine = MachineWithConf(CONF_RAID);
        SuperblockExpect(machine, "nuroboot", nMd);
        const RUN_RESULT result = MachineCall(machine, [nMd] {
            int nFound = UNTOUCHED;
            EXPECT_EQ(RAIDDiskIsUsedByRAID("/dev/nuroboot", &nFound), nMd >= 101 ? 1 : 0);
            EXPECT_EQ(nFound, nMd >= 101 ? nMd : UNTOUCHED);
        });
        EXPECT_EQ(TranscriptText(result), "/sbin/mdadm -E /dev/nuroboot\n");
    }
}

// A name of nothing but "/dev" has no further slash to look behind.
TEST(OddMachine, ADeviceFolderIsOnNoPort)
{
    MachineCall(MachineWithConf(CONF_RAID), [] {
        EXPECT_EQ(ExternalDiskPortCheck("/dev"), UNKNOWN_DEVICE);
        EXPECT_EQ(ExternalDiskPortCheck("/dev/SDA"), UNKNOWN_DEVICE);
        EXPECT_EQ(ExternalDiskPortCheck("/dev/sd"), OTHER_DEVICE);
    });
}

TEST(OddMachine, PortTypesBeyondTheLastHaveNoContainer)
{
    for (const int type : {0, 5, 6, 9, 10, 11, -1}) {
        u32 mask = UNTOUCHED;
        EXPECT_EQ(DiskContainerFromPortType(static_cast<DISK_PORT_TYPE>(type), &mask), -1) << type;
        EXPECT_EQ(mask, static_cast<u32>(UNTOUCHED));
    }
    EXPECT_EQ(DiskContainerFromPortType(INTERNAL_DEVICE, nullptr), -1);
}

// As where there are none; nothing is said about it.
TEST(OddMachine, HostsThatCannotBeListedHaveNoUnit)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    machine.faults = {{.szFunction = "scandir", .error = EACCES}};
    QuietCall(machine, [] {
        char szUnits[64] = "x";
        EXPECT_EQ(ExternalDiskPortEnumEunit(1, szUnits, sizeof(szUnits)), -1);
        EXPECT_STREQ(szUnits, "");
    });
}

TEST(OddMachine, ASyncActionOfOneByteIsIdle)
{
    MACHINE machine = MachineMake();
    MachineMdAdd(machine, {.nMd = 2, .szSyncAction = "x"});
    MachineMdAdd(machine, {.nMd = 3, .szSyncAction = "\n"});
    MachineMdAdd(machine, {.nMd = 4, .szSyncAction = "unheard of\n"});
    MachineFile(machine, "/sys/block/md5/md/sync_action", std::string("\0idle\n", 6));
    MachineCall(machine, [] {
        for (const int nMd : {2, 3, 5}) {
            int action = UNTOUCHED;
            EXPECT_EQ(RAIDSyncActionGet(nMd, &action), 0) << nMd;
            EXPECT_EQ(action, 0) << nMd;
        }
        int action = UNTOUCHED;
        EXPECT_EQ(RAIDSyncActionGet(4, &action), -1);
        EXPECT_EQ(RAIDSyncActionGet(-1, &action), -1);
        EXPECT_EQ(RAIDSyncActionGet(2, nullptr), -1);
        EXPECT_EQ(action, UNTOUCHED);
    });
}

// The member list is read after the size; the same words tell of both its failures.
TEST(OddMachine, AMemberListThatCannotBeReadEndsTheQuery)
{
    MACHINE machine = MachineMake();
    MachineMdAdd(machine, {.nMd = 2, .members = {{"sda3"}}});
    machine.faults = {{.szFunction = "glob", .error = EIO}};
    const RUN_RESULT result = MachineCall(machine, [] {
        RAID_INFO *pInfo = nullptr;
        EXPECT_EQ(RAIDInfoGet("/dev/md2", &pInfo), -1);
        EXPECT_EQ(pInfo, nullptr);
        EXPECT_EQ(NLIBCErrGet(), ERR_SYSCALL_FAILED);
    });
    EXPECT_NE(LogText(result).find(
                  "<15>raid_info.cpp:# Failed to get disk list for /dev/md2, errno=0X8000\n"),
              std::string::npos)
        << LogText(result);
}

// Without memory for a word the kernel's list names no driver, so the array is not partitionable.
TEST(OddMachine, WithoutMemoryNoDriverIsKnown)
{
    constexpr unsigned int MAJOR_MDP = 254;
    MACHINE machine = MachineMake();
    MachineMdAdd(machine, {.nMd = 2, .deviceMajor = MAJOR_MDP, .deviceMinor = 128});
    MachineFile(machine, "/sys/block/md_d2/md/component_size", "1000\n");
    MachineFile(machine, "/sys/block/md128/md/component_size", "3000\n");
    const auto sectors = [] {
        const int fd = open("/dev/md2", O_RDONLY | O_CLOEXEC);
        printf("%llu", static_cast<unsigned long long>(RAIDComponentSizeGet(fd)));
        (void)close(fd);
    };
    EXPECT_EQ(MachineCall(machine, sectors).szOut, "2000");
    machine.faults = {{.szFunction = "realloc", .error = ENOMEM}};
    EXPECT_EQ(MachineCall(machine, sectors).szOut, "6000");
}

TEST(OddMachine, BothStatesOfASystemDiskNeedAPlace)
{
    RAID_INFO root = {};
    RAID_INFO swap = {};
    RAID_INFO *const pair[2] = {&root, &swap};
    u32 state = UNTOUCHED;
    for (const bool fRoot : {true, false}) {
        EXPECT_FAILS(RAIDSystemDiskStatusDetailGet(pair, "/dev/sda", fRoot ? &state : nullptr,
                                                   fRoot ? nullptr : &state),
                     -1, ERR_BAD_PARAMETER);
    }
    EXPECT_EQ(state, static_cast<u32>(UNTOUCHED));
}

// The time stamp is for people; without one the line is there all the same.
TEST(OddMachine, AnErrorIsLoggedWithoutATimeToo)
{
    for (const char *const szFunction : {"localtime_r", "strftime"}) {
        SCOPED_TRACE(szFunction);
        MACHINE machine = MachineMake();
        MachineTool(machine, "/sbin/mdadm -S /dev/md2", {.szErr = "busy\n", .status = 1});
        machine.faults = {{.szFunction = szFunction, .error = EINVAL}};
        MachineCall(machine,
                    [] { EXPECT_EQ(SpaceExecl("/sbin/mdadm", "-S", "/dev/md2", NULL), 256); });
        EXPECT_EQ(MachineFileRead("/var/log/space_operation_error.log"),
                  " command=\"/sbin/mdadm -S /dev/md2\" Error=\"busy \"\n");
    }
}

} // namespace
