// SPDX-License-Identifier: MIT
#pragma once

// What has to be looked at outside, before a rehearsal has mounts and processes of its own.

#include "options.h"

#include <sys/types.h>

struct MOUNT {
    dev_t device;
    std::string szPath;
};

struct HOST {
    std::vector<MOUNT> mounts;
    std::vector<dev_t> swaps;
    std::vector<pid_t> otherRuns; // of the same tool, at this moment
    WORDS udevRules;              // that act on arrays and groups by themselves, where udev runs
    WORDS markers;                // paths of those that are set, before the tool sets one itself
};

HOST HostRead(const OPTIONS &options);
