// SPDX-License-Identifier: MIT
#pragma once

// The functions of the command layer that also answer for what no command hands them.

#include "nurocore/szlist.h"
#include "nurocore/types.h"
#include "nurostoragecore/raid_info.h"

#include <sys/types.h>

// What is to be done with a disk; also the exit status of the child that decides it.
constexpr int FORMAT_NONE = 0;         // left alone
constexpr int FORMAT_WIPE = 1;         // all partitions are deleted
constexpr int FORMAT_KEEP_DATA = 2;    // only the system partitions are made anew
constexpr int FORMAT_UNRECOGNISED = 4; // as KEEP_DATA if no other disk keeps its data

// The child process of one disk, and the decision in its exit status.
struct DISK_CHILD {
    pid_t pid;
    int type;
};

struct FORMAT_LISTS {
    PNLIBSZLIST pAll;
    PNLIBSZLIST pKeepData;
    PNLIBSZLIST pFormatAll;
};

// Prints what `status` says of an array.
void ReportPrint(const RAID_INFO &info);

// What has to be done with a disk so that it has the system partitions of the wanted layout.
int DiskFormatTypeGet(const char *szDisk, u32 wanted);

// Partitions a disk as its type says. Returns the exit status of the child that does it.
int PartitionInChild(const char *szDisk, int type, u32 version);

// The option of mdadm that chooses an array's superblock format; empty for the usual one.
const char *MetadataOption(const char *szMd);

// Creates an array of nSlot slots from the nDisk members listed. Returns 0, -1 on failure.
int SystemRaidCreate(const char *szMd, int nDisk, int nSlot, const char *szMembers);

// Waits for the children and sorts their disks into the lists. Returns 0, -1 when a disk finds no
// place.
int FormatTypesCollect(const DISK_CHILD *pChildren, FORMAT_LISTS &lists);
