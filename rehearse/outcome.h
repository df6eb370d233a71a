// SPDX-License-Identifier: MIT
#pragma once

// What becomes of the disks, from the recorded commands alone: each is carried out on a picture of
// the disk's partitions. What the tool had in mind is not asked.

#include "inventory.h"
#include "run.h"

enum class FATE {
    ALONE,    // no command names it
    USED,     // an array is made of its partitions, or a superblock erased; no partition is changed
    PREPARED, // there was nothing, now there are partitions
    RENEWED,  // some partitions are made anew, those with data stay
    DATA_WIPED, // the data partitions go, the others stay
    WIPED,      // nothing of what was there stays
};

const char *FateText(FATE fate);

struct PIECE {
    int number;
    std::uint64_t start;
    std::uint64_t nSector;
    bool fKept; // it was there before, and is still what it was
};

// A partition that cannot be made, as it would not fit.
struct MISFIT {
    int number;
    std::uint64_t start;
};

struct DISK_OUTCOME {
    const DISK *pDisk;
    FATE fate;
    std::vector<PIECE> after;
    WORDS taken; // paths of partitions that a command deletes or overwrites
    std::vector<MISFIT> misfits;
    bool fAsked;  // a question or a command names it or one of its partitions
    bool fSigned; // it gets a new table, and old signatures go
};

// Something that a recorded command takes.
struct LOSS {
    std::string szText;
    WORDS mounts;
};

struct OUTCOME {
    std::vector<DISK_OUTCOME> disks; // in the inventory's order
    WORDS taken;   // paths of all partitions, arrays and disks that lose what they hold
    WORDS stopped; // arrays that are stopped
    WORDS groups;  // names of groups that are removed
    std::vector<LOSS> losses;
};

OUTCOME OutcomeOf(const INVENTORY &inventory, const RUN &run);
