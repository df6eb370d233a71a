// SPDX-License-Identifier: MIT
#pragma once

// The command line of the partitioner:
//   sfdisk -M1 DISK
//   sfdisk -N<n> -uS -j<skip> -z<size|-1> -t<hex> [-q] [-f] [-F] DISK
//   sfdisk --fast-delete <from:to|-1> DISK
//   sfdisk -l -uS -N<n> DISK
// An empty argument is ignored, except as the range of --fast-delete, where it is a bad value.
// Counts are 512-byte sectors.

#include "partition.h"

enum COMMAND {
    COMMAND_SIGN,
    COMMAND_CREATE,
    COMMAND_DELETE,
    COMMAND_LIST,
};

constexpr u64 SIZE_REST_OF_DISK = ~u64{0};

struct REQUEST {
    COMMAND command;
    const char *szDisk;
    int number;  // partition to create or to list
    u64 skip;    // sectors between the partition before and the new one
    u64 sectors; // SIZE_REST_OF_DISK: up to the last sector that the table can address
    u32 type;
    int firstDeleted;
    int lastDeleted;
};

// Fills the request, or reports what is wrong with the arguments. Opens and changes nothing.
int RequestRead(int argc, char **argv, REQUEST *pRequest);
