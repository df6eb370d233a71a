// SPDX-License-Identifier: MIT
//
// What a disk or a partition more costs, on machines of the sandbox. Prints tables; the times are
// for reading, only what was done is checked.
#include "hwcontrol/disk_port.h"
#include "nurocore/hash.h"
#include "nurocore/szlist.h"
#include "nurostoragecore/partition_enum.h"
#include "nurostoragecore/raid_remove.h"
#include "storage_machine.h"

#include <algorithm>
#include <cstdio>
#include <ctime>
#include <functional>
#include <gtest/gtest.h>
#include <string>
#include <vector>

namespace
{

constexpr int LETTERS = 26;
constexpr int LIST_SIZE = 1024;
constexpr int ROUNDS = 21;

std::string DiskName(int nDisk)
{
    std::string szName = "sd";
    if (nDisk >= LETTERS) {
        szName += static_cast<char>('a' + nDisk / LETTERS - 1);
    }
    return szName + static_cast<char>('a' + nDisk % LETTERS);
}

// Processor time of this process alone, or of the world's clock.
double MicrosecondsNow(clockid_t clock)
{
    constexpr double PER_SECOND = 1e6;
    constexpr double PER_NANOSECOND = 1e-3;
    timespec now = {};
    (void)clock_gettime(clock, &now);
    return static_cast<double>(now.tv_sec) * PER_SECOND +
           static_cast<double>(now.tv_nsec) * PER_NANOSECOND;
}

double MedianOf(std::vector<double> values)
{
    std::nth_element(values.begin(), values.begin() + static_cast<long>(values.size() / 2),
                     values.end());
    return values[values.size() / 2];
}

// The median of what the body takes of the processor.
double ProcessorTime(const std::function<void()> &body)
{
    std::vector<double> rounds;
    for (int i = 0; i < ROUNDS; i++) {
        const double start = MicrosecondsNow(CLOCK_PROCESS_CPUTIME_ID);
        body();
        rounds.push_back(MicrosecondsNow(CLOCK_PROCESS_CPUTIME_ID) - start);
    }
    return MedianOf(rounds);
}

void RowPrint(int nThing, double total)
{
    (void)printf("| %d | %.0f | %.2f |\n", nThing, total, total / nThing);
}

void HeadPrint(const char *szThings, const char *szTotal)
{
    (void)printf("\n| %s | %s | for each |\n|---:|---:|---:|\n", szThings, szTotal);
    (void)fflush(stdout);
}

// ---- disks -------------------------------------------------------------------------------------

int DisksFound(DISK_PORT_TYPE type)
{
    PNLIBSZLIST pDisks = NLIBCSzListAlloc(LIST_SIZE);
    const LIST_OWNER owner(&pDisks);
    return ExternalDiskPortEnum(type, &pDisks) == 0 ? pDisks->nItem : -1;
}

TEST(Growth, OfTheEnumerationOfDisks)
{
    HeadPrint("disks", "processor time, us");
    for (const int nDisk : {4, 26, 702}) {
        MACHINE machine = MachineWithConf(CONF_RAID);
        for (int i = 0; i < nDisk; i++) {
            MachineDiskAdd(machine, DiskName(i));
        }
        const RUN_RESULT result = MachineCall(machine, [nDisk] {
            EXPECT_EQ(DisksFound(INTERNAL_DEVICE), 4);
            RowPrint(nDisk, ProcessorTime([] { (void)DisksFound(INTERNAL_DEVICE); }));
        });
        (void)printf("%s", result.szOut.c_str());
    }
}

// ---- superblocks -------------------------------------------------------------------------------

constexpr int PARTITIONS_OF_A_DISK = 10;
constexpr int PARTITION_FIRST = 3; // the first that holds data

MACHINE MachineOfPartitions(int nPartition)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    for (int i = 0; i < nPartition; i++) {
        const std::string szDisk = DiskName(i / PARTITIONS_OF_A_DISK);
        if (i % PARTITIONS_OF_A_DISK == 0) {
            MachineDiskAdd(machine, szDisk);
        }
        MachinePartitionAdd(machine, szDisk, PARTITION_FIRST + i % PARTITIONS_OF_A_DISK, 2048,
                            2048);
    }
    MachineTool(machine, {"/sbin/mdadm", "-E", ANY_ARGUMENT},
                {.szOut = Examination(2), .nTimes = nPartition});
    return machine;
}

int SuperblocksFound()
{
    PNLIBHASH pHash = NLIBCHashAlloc(LIST_SIZE);
    const HASH_OWNER owner(&pHash);
    return RAIDUUIDHashForRemoveGet(&pHash) == 0 ? pHash->nEntry : -1;
}

TEST(Growth, OfTheScanForSuperblocks)
{
    HeadPrint("partitions", "us, each with a report of its own");
    for (const int nPartition : {10, 100, 1000}) {
        const RUN_RESULT result = MachineCall(MachineOfPartitions(nPartition), [nPartition] {
            const double start = MicrosecondsNow(CLOCK_MONOTONIC);
            EXPECT_EQ(SuperblocksFound(), nPartition);
            RowPrint(nPartition, MicrosecondsNow(CLOCK_MONOTONIC) - start);
        });
        (void)printf("%s", result.szOut.c_str());
    }
}

int PartitionsFound()
{
    PNLIBSZLIST pPartitions = NLIBCSzListAlloc(LIST_SIZE);
    const LIST_OWNER owner(&pPartitions);
    return PartitionPathEnum(nullptr, &pPartitions);
}

TEST(Growth, OfTheEnumerationOfPartitions)
{
    HeadPrint("partitions", "processor time, us");
    for (const int nPartition : {10, 100, 1000}) {
        MACHINE machine = MachineOfPartitions(nPartition);
        machine.rows.clear();
        const RUN_RESULT result = MachineCall(machine, [nPartition] {
            EXPECT_GT(PartitionsFound(), nPartition);
            RowPrint(nPartition, ProcessorTime([] { (void)PartitionsFound(); }));
        });
        (void)printf("%s", result.szOut.c_str());
    }
}

// ---- preparing disks ---------------------------------------------------------------------------

constexpr int PARTITIONER_MS = 400;

// Blank disks, and a partitioner that takes its time for each of its seven runs on a disk.
MACHINE MachineToPrepare(int nDisk)
{
    MACHINE machine = MachineWithConf("maxdisks=\"24\"\n"
                                      "supportraid=\"yes\"\n"
                                      "support_buildin_storage=\"no\"\n"
                                      "usbportcfg=\"0x30000000\"\n"
                                      "esataportcfg=\"0x40000000\"\n"
                                      "internalportcfg=\"0xffffff\"\n");
    for (int i = 0; i < nDisk; i++) {
        BlankDiskAdd(machine, DiskName(i));
        RenewExpect(machine, DiskName(i), RANGE_ALL);
    }
    for (TOOL_ROW &row : machine.rows) {
        row.answer.msDelay = PARTITIONER_MS;
    }
    for (const char *const szMd : {"/dev/md0", "/dev/md1"}) {
        MachineTool(machine, {"/sbin/mdadm", "-C", szMd, ANY_REST});
    }
    return machine;
}

long CommandsIn(const RUN_RESULT &result)
{
    return std::count_if(result.events.begin(), result.events.end(),
                         [](const RUN_EVENT &event) { return event.kind == EVENT_KIND::COMMAND; });
}

TEST(Growth, OfThePreparationOfDisks)
{
    constexpr int COMMANDS_OF_A_DISK = 7;
    constexpr int ARRAYS = 2;
    (void)printf("\n| disks | ms | of those of one disk | processes on the disks |\n"
                 "|---:|---:|---:|---:|\n");
    double one = 0;
    for (const int nDisk : {1, 8, 24}) {
        const RUN_RESULT result = MachineRun(MachineToPrepare(nDisk), {"initsys"});
        EXPECT_EQ(result.status, 0);
        const long nCommand = CommandsIn(result) - ARRAYS;
        EXPECT_EQ(nCommand, nDisk * COMMANDS_OF_A_DISK);
        one = nDisk == 1 ? result.seconds : one;
        (void)printf("| %d | %.0f | %.2f | %ld |\n", nDisk, result.seconds * 1e3,
                     result.seconds / one, nCommand);
    }
}

} // namespace
