// SPDX-License-Identifier: MIT
#pragma once

// Where the programs are that change disks or tell of them. The appliance has them at these places;
// nothing is looked up in PATH.

inline constexpr char MDADM_PATH[] = "/sbin/mdadm";
inline constexpr char SFDISK_PATH[] = "/sbin/sfdisk";
inline constexpr char PVS_PATH[] = "/sbin/pvs";
inline constexpr char LVREMOVE_PATH[] = "/sbin/lvremove";
inline constexpr char VGREMOVE_PATH[] = "/sbin/vgremove";
inline constexpr char PVREMOVE_PATH[] = "/sbin/pvremove";
inline constexpr char UMOUNT_PATH[] = "/bin/umount";
