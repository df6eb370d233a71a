// SPDX-License-Identifier: MIT
#pragma once

// What a run with failing calls may do, measured by the undisturbed run on the same machine.

#include "situations.h"

#include <map>
#include <string>
#include <vector>

// What is wrong with a run, and what is unlike the undisturbed one but allowed.
struct VERDICT {
    std::vector<std::string> wrong;
    std::map<size_t, size_t> allowed; // row of the table of allowances -> how often
};

VERDICT Judge(const SITUATION &situation, const RUN_RESULT &clean, const RUN_RESULT &result);

// Whether any call was made to fail.
bool WasInjected(const RUN_RESULT &result);

// "failed: fgets 3 0.1 /proc/mounts", one line each, and how many more there are.
std::string FaultText(const RUN_RESULT &result);

size_t AllowanceCount();
std::string AllowanceText(size_t row);
