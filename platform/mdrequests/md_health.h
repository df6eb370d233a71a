// SPDX-License-Identifier: MIT
#pragma once

// What the stock md driver publishes of an array in sysfs, turned into the two answers that the
// appliance's own driver gives directly: the array's health and the progress of its resync.
//
// Attributes are text, answers are records. Reading the files is one function that takes the
// directory as its argument, so that a test can describe an array without a driver.

#include <cstddef>
#include <cstdint>

// Slots beyond this count as in sync. The 0.90 format has 27 slots, and real machines stay far
// below this number.
constexpr int MD_MAX_SLOTS = 512;

// Values of the health request.
constexpr std::int32_t MD_HEALTH_NORMAL = 0;
constexpr std::int32_t MD_HEALTH_DEGRADED = 1;
constexpr std::int32_t MD_HEALTH_CRASHED = 2;

// The data of the progress request, in the order and width the request has them.
struct MD_SYNC_STATUS {
    std::uint64_t activity; // 0 idle, 1 something runs, is delayed or is pending
    std::uint64_t done;     // 512-byte sectors; 0 while it waits
    std::uint64_t total;    // 512-byte sectors; 0 when the driver does not report it
};

// One array as its attribute files describe it. A file that is missing leaves an empty text: the
// driver publishes the redundancy attributes only for levels that have redundancy.
struct MD_ATTRIBUTES {
    char szArrayState[32];
    char szLevel[32];
    char szRaidDisks[32];
    char szLayout[32];
    char szDegraded[32];
    char szSyncAction[32];
    char szSyncCompleted[64];
    char szResyncStart[32];
    bool fInSync[MD_MAX_SLOTS]; // slot N has a member whose data is current
};

// Reads the attributes below szMdDir, e.g. "/sys/dev/block/9:0/md". Returns 0, or -1 when there is
// no array_state file, which means no array at all. One that disappears during the call is left
// with an empty state, which counts as not running.
int MdAttributesRead(const char *szMdDir, MD_ATTRIBUTES *pAttributes);

// True when the state is one in which the driver serves the array.
bool MdIsRunning(const MD_ATTRIBUTES *pAttributes);

// True when the text of a member's state file says that its data is current.
bool MdMemberIsInSync(const char *szState);

// One of the MD_HEALTH_* values.
std::int32_t MdHealthGet(const MD_ATTRIBUTES *pAttributes);

// Never fails: an attribute that is missing or unreadable means that nothing runs.
MD_SYNC_STATUS MdSyncStatusGet(const MD_ATTRIBUTES *pAttributes);
