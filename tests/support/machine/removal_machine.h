// SPDX-License-Identifier: MIT
#pragma once

// What the cases of taking an array down share: disks, reports of superblocks, the commands.

#include "last_error.h"
#include "sandbox.h"

#include "nurostoragecore/raid_info.h"

#include <cstddef>
#include <cstdio>
#include <ctime>
#include <sstream>
#include <string>
#include <vector>

inline constexpr char UUID_MD2[] = "5b1f2c3d:4e5f6071:8293a4b5:00000002";
inline constexpr char UUID_MD3[] = "5b1f2c3d:4e5f6071:8293a4b5:00000003";

// A report that says no more than the UUID.
inline std::string ReportOf(const std::string &szUuid)
{
    return "/dev/sdx3:\n          Magic : a92b4efc\n     Array UUID : " + szUuid + "\n";
}

inline std::string ExamineCommand(const std::string &szName)
{
    return "/sbin/mdadm -E /dev/" + szName;
}

inline std::string WipeCommand(const std::string &szName)
{
    return "/sbin/mdadm --zero-superblock /dev/" + szName;
}

inline void ExamineExpect(MACHINE &machine, const std::string &szName, const std::string &szUuid,
                          int nTimes = 1)
{
    MachineTool(machine, ExamineCommand(szName), {.szOut = ReportOf(szUuid), .nTimes = nTimes});
}

inline void BlankMemberExpect(MACHINE &machine, const std::string &szName, int nTimes = 1)
{
    MachineTool(machine, ExamineCommand(szName),
                {.szErr = "mdadm: No md superblock detected on /dev/" + szName + ".\n",
                 .status = 1,
                 .nTimes = nTimes});
}

// Partitions 1 to nPartition.
inline void DiskWithPartitionsAdd(MACHINE &machine, const std::string &szDisk, int nPartition)
{
    constexpr std::uint64_t SECTORS = 1048576;
    MachineDiskAdd(machine, szDisk);
    for (int i = 1; i <= nPartition; i++) {
        const std::uint64_t start = 2048 + SECTORS * static_cast<std::uint64_t>(i - 1);
        MachinePartitionAdd(machine, szDisk, i, start, SECTORS);
    }
}

// Two disks with three partitions, md2 on the third of each.
inline MACHINE MachineWithMirror()
{
    MACHINE machine = MachineMake();
    DiskWithPartitionsAdd(machine, "sda", 3);
    DiskWithPartitionsAdd(machine, "sdb", 3);
    MachineMdAdd(machine, {.nMd = 2, .members = {{"sda3"}, {"sdb3", "in_sync\n", "1\n"}}});
    return machine;
}

inline RAID_INFO RecordOf(const std::string &szPath, const std::string &szUuid = "")
{
    RAID_INFO info = {};
    (void)snprintf(info.szPath, sizeof(info.szPath), "%s", szPath.c_str());
    (void)snprintf(info.szUuid, sizeof(info.szUuid), "%s", szUuid.c_str());
    return info;
}

inline constexpr size_t STAMP_SIZE = sizeof("Nov 05 01:02:03 ") - 1;

// Such a stamp stands at the start of the line.
inline bool IsStamped(const std::string &szLine)
{
    struct tm time = {};
    const char *const pchEnd = strptime(szLine.c_str(), "%b %d %H:%M:%S ", &time);
    return pchEnd == szLine.c_str() + STAMP_SIZE && szLine[4] != ' ';
}

// The operation error log with its time stamps masked; one that is not of the form stays.
inline std::string OperationErrors()
{
    std::istringstream log(MachineFileRead("/var/log/space_operation_error.log").value_or(""));
    std::string szText;
    for (std::string szLine; std::getline(log, szLine);) {
        szText += (IsStamped(szLine) ? "<time> " + szLine.substr(STAMP_SIZE) : szLine) + "\n";
    }
    return szText;
}
