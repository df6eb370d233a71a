// SPDX-License-Identifier: MIT
#pragma once

// Paths of the programs that change disks or report on them. The appliance has them at these
// places; PATH is not searched.

inline constexpr char MDADM_PATH[] = "/sbin/mdadm";
inline constexpr char SFDISK_PATH[] = "/sbin/sfdisk";
inline constexpr char PVS_PATH[] = "/sbin/pvs";
inline constexpr char LVREMOVE_PATH[] = "/sbin/lvremove";
inline constexpr char VGREMOVE_PATH[] = "/sbin/vgremove";
inline constexpr char PVREMOVE_PATH[] = "/sbin/pvremove";
inline constexpr char UMOUNT_PATH[] = "/bin/umount";
