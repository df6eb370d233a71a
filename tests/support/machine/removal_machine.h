// SPDX-License-Identifier: MIT
#pragma once

// Shared by the tests of removing an array: disks, reports of superblocks, the commands.

#include "steps.h"

#include "nurostoragecore/raid_info.h"

#include <cstdio>
#include <string>

inline constexpr char UUID_MD2[] = "5b1f2c3d:4e5f6071:8293a4b5:00000002";
inline constexpr char UUID_MD3[] = "5b1f2c3d:4e5f6071:8293a4b5:00000003";

// A report that has only the UUID.
inline std::string ReportOf(const std::string &szUuid)
{
    return "/dev/sdx3:\n          Magic : a92b4efc\n     Array UUID : " + szUuid + "\n";
}

inline constexpr char STOP_MD2[] = "/sbin/mdadm -S /dev/md2";

inline STEP Examined(const std::string &szName, const std::string &szUuid)
{
    return {"/sbin/mdadm -E /dev/" + szName, {.szOut = ReportOf(szUuid)}};
}

inline STEP ExaminedBlank(const std::string &szName)
{
    return {"/sbin/mdadm -E /dev/" + szName,
            {.szErr = "mdadm: No md superblock detected on /dev/" + szName + ".\n", .status = 1}};
}

inline STEPS Wiped(const std::string &szName)
{
    return {{"/sbin/mdadm --zero-superblock /dev/" + szName},
            {"<11>raid_remove.cpp:# [Info] Clean RAID superblock on '/dev/" + szName + "'"}};
}

inline STEPS WipeFailed(const std::string &szName, const TOOL_ANSWER &answer)
{
    return {{"/sbin/mdadm --zero-superblock /dev/" + szName, answer},
            {"<11>raid_remove.cpp:# Failed to zero RAID superblock '/dev/" + szName + "'"},
            {"<11>raid_remove.cpp:# Failed to clean suerblock of '/dev/" + szName + "'"}};
}

// One failed attempt, and the pause of a second before the next.
inline STEPS StopFailed(const TOOL_ANSWER &answer)
{
    return {{STOP_MD2, answer},
            {"<11>raid_remove.cpp:# Failed to mdadm stop '/dev/md2'"},
            {"<11>raid_remove.cpp:# Fail to stop [/dev/md2], try again"},
            {"sleep 1"}};
}

inline const STEP LIMIT_TOLD = {"<11>raid_remove.cpp:# Reach RAID stop retry limit"};
inline const STEP CLEAN_TOLD = {"<11>raid_remove.cpp:# [Info] clean RAID superblock of /dev/md2"};

// The steps after a mirror of sda3 and sdb3 has been stopped.
inline STEPS MirrorExamined()
{
    return {CLEAN_TOLD, Examined("sda3", UUID_MD2), Examined("sdb3", UUID_MD2)};
}

inline STEPS MirrorWiped()
{
    return MirrorExamined() + Wiped("sda3") + Wiped("sdb3");
}

// ---- LVM ---------------------------------------------------------------------------------------

// With the two blanks that pvs sets in front.
inline constexpr char ROW_MD2[] = "  /dev/md2:vg1:lv1:\n";

inline STEPS Pvs(const std::string &szRows)
{
    return {{"/sbin/pvs -o pv_name,vg_name,lv_name,origin --noheading --separator :",
             {.szOut = szRows}}};
}

inline const STEP LV_REMOVED = {"/sbin/lvremove -f /dev/vg1/lv1"};
inline const STEP VG_REMOVED = {"/sbin/vgremove -f /dev/vg1"};
inline const STEP PV_REMOVED = {"/sbin/pvremove -f /dev/md2"};
inline const STEPS LVM_REMOVED = {LV_REMOVED, VG_REMOVED, PV_REMOVED};

// One of these that fails, and what is told of it.
inline STEPS RemoverFailed(const STEP &step, const TOOL_ANSWER &answer)
{
    return {{step.szText, answer}, {"<11>lvm.cpp:# Failed to " + step.szText}};
}

inline STEPS RemoversFailed(const TOOL_ANSWER &lv, const TOOL_ANSWER &vg, const TOOL_ANSWER &pv)
{
    return RemoverFailed(LV_REMOVED, lv) + RemoverFailed(VG_REMOVED, vg) +
           RemoverFailed(PV_REMOVED, pv);
}

// ---- machines ----------------------------------------------------------------------------------

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

// Disks of so many partitions each.
inline MACHINE MachineWithDisks(const std::vector<std::string> &disks, int nPartition)
{
    MACHINE machine = MachineMake();
    for (const std::string &szDisk : disks) {
        DiskWithPartitionsAdd(machine, szDisk, nPartition);
    }
    return machine;
}

// Two disks with three partitions, md2 on the third of each.
inline MACHINE MachineWithMirror()
{
    MACHINE machine = MachineWithDisks({"sda", "sdb"}, 3);
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

inline std::string OperationErrors()
{
    return MachineFileRead("/var/log/space_operation_error.log").value_or("");
}
