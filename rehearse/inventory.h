// SPDX-License-Identifier: MIT
#pragma once

// What the machine holds at this moment: from sysfs, libblkid, the examine reports and pvs. Nothing
// here is written to, and nothing is decided.

#include "host.h"

#include <cstdint>

// What libblkid finds at the beginning of a device. There may be more than one.
struct SIGNATURE {
    std::string szType; // "ext4", "linux_raid_member", "gpt"
    std::string szLabel;
    bool fTable; // a partition table
};

// What an examine report says of a member.
struct SUPERBLOCK {
    bool fFound = false;
    std::string szUuid;
    std::string szLevel;
    std::string szRole;
    std::uint64_t nDevices = 0;
    std::string
        szMd; // "md2", from the name or the preferred minor; empty when neither has a number
};

// A disk, partition, array or volume.
struct DEVICE {
    std::string szName; // "sda3"
    std::string szPath;
    std::uint64_t nSector = 0; // of 512 bytes
    std::vector<SIGNATURE> signatures;
    SUPERBLOCK superblock;
    WORDS holders; // "md2", "dm-0"
    WORDS mounts;
    bool fSwap = false;
    bool fReadable = true;
};

struct PARTITION {
    int number = 0;
    std::uint64_t start = 0;
    DEVICE device;
};

struct DISK {
    DEVICE device;
    std::string szModel;
    std::string szSerial;
    bool fReadOnly = false;
    std::vector<PARTITION> partitions; // by number
};

// An array, running or known from the superblocks of its members alone.
struct ARRAY {
    DEVICE device; // its name is empty when no number is known
    bool fRunning = false;
    std::string szLevel;
    std::string szUuid;
    std::uint64_t nSlot = 0;
    std::uint64_t nMissing = 0;
    WORDS members; // names of devices
};

struct VOLUME {
    std::string szName;
    DEVICE device;
};

struct GROUP {
    std::string szName;
    WORDS devices; // paths of its physical volumes
    std::vector<VOLUME> volumes;
};

struct INVENTORY {
    std::vector<DISK> disks;
    std::vector<ARRAY> arrays;
    std::vector<GROUP> groups;
    WORDS rows; // of pvs, as the tool sees them
};

// Questions are asked of the real programs, on the stage.
INVENTORY InventoryRead(const HOST &host);

// The device of a path such as "/dev/sda3"; nullptr when the machine has none.
const DEVICE *InventoryFind(const INVENTORY &inventory, const std::string &szPath);
const DISK *InventoryDiskOf(const INVENTORY &inventory, const std::string &szPath);

// The fields of an examine report.
SUPERBLOCK SuperblockParse(const std::string &szReport);
