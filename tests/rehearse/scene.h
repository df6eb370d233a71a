// SPDX-License-Identifier: MIT
#pragma once

// Machines that exist as records alone, for what is derived from them.

#include "warnings.h"

constexpr std::uint64_t DISK_SECTORS = 20000000;

inline PARTITION PartitionOf(const std::string &szDisk, int number, std::uint64_t start,
                             std::uint64_t nSector)
{
    PARTITION partition;
    partition.number = number;
    partition.start = start;
    partition.device.szName = szDisk + std::to_string(number);
    partition.device.szPath = "/dev/" + partition.device.szName;
    partition.device.nSector = nSector;
    return partition;
}

inline DISK BlankDisk(const std::string &szName)
{
    DISK disk;
    disk.device.szName = szName;
    disk.device.szPath = "/dev/" + szName;
    disk.device.nSector = DISK_SECTORS;
    return disk;
}

// Layout 8 with a data partition that is a member of md2.
inline DISK DataDisk(const std::string &szName)
{
    DISK disk = BlankDisk(szName);
    disk.device.signatures = {{.szType = "dos", .szLabel = "", .fTable = true}};
    disk.partitions = {PartitionOf(szName, 1, 2048, 4980480),
                       PartitionOf(szName, 2, 4982528, 4194304),
                       PartitionOf(szName, 3, 9437184, 1000000)};
    DEVICE &data = disk.partitions[2].device;
    data.signatures = {{.szType = "linux_raid_member", .szLabel = "", .fTable = false}};
    data.superblock.fFound = true;
    data.superblock.szUuid = "1:2:3:4";
    data.superblock.szMd = "md2";
    return disk;
}

inline ARRAY DataArray(const WORDS &members)
{
    ARRAY array;
    array.device.szName = "md2";
    array.device.szPath = "/dev/md2";
    array.device.nSector = 1000000;
    array.fRunning = true;
    array.szLevel = "raid1";
    array.szUuid = "1:2:3:4";
    array.nSlot = members.size();
    array.members = members;
    return array;
}

// Group vg1 with a mounted volume of 1 GiB.
inline GROUP FilmsGroup(const WORDS &devices, const WORDS &mounts)
{
    VOLUME volume;
    volume.szName = "films";
    volume.device.szPath = "/dev/vg1/films";
    volume.device.nSector = 2097152;
    volume.device.signatures = {{.szType = "ext4", .szLabel = "cinema", .fTable = false}};
    volume.device.mounts = mounts;
    return {.szName = "vg1", .devices = devices, .volumes = {volume}};
}

// A command, or a question with the status in wait's form.
inline COMMAND CommandOf(const std::string &szLine, bool fQuestion = false, int status = 0)
{
    return {.argv = Split(szLine, ' '),
            .pid = 10,
            .parent = 5,
            .fQuestion = fQuestion,
            .status = status};
}

inline RUN RunOf(const WORDS &lines)
{
    RUN run;
    for (const std::string &szLine : lines) {
        run.commands.push_back(CommandOf(szLine));
    }
    return run;
}
