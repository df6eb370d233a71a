// SPDX-License-Identifier: MIT
#pragma once

// Owners of the records that this library hands out.

#include "nurostoragecore/raid_disk.h"
#include "nurostoragecore/raid_info.h"

#include <memory>

struct RAID_INFO_DELETER {
    void operator()(RAID_INFO *pInfo) const
    {
        RAIDInfoFree(pInfo);
    }
};

using RAID_INFO_OWNER = std::unique_ptr<RAID_INFO, RAID_INFO_DELETER>;

struct RAID_DISK_DELETER {
    void operator()(RAID_DISK *pDisks) const
    {
        RAIDDiskListFree(pDisks);
    }
};

using RAID_DISK_OWNER = std::unique_ptr<RAID_DISK, RAID_DISK_DELETER>;
