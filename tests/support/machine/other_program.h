// SPDX-License-Identifier: MIT
#pragma once

#include "sandbox.h"

// Lays the machine out and runs another program than the tool: a file of the machine, whose path
// comes first. Nothing stands between it and the C library; problems are only listed in the result.
RUN_RESULT MachineTryOther(const MACHINE &machine, const std::vector<std::string> &arguments);

// The same on the machine as the last run left it.
RUN_RESULT MachineTryOtherAgain(const MACHINE &machine, const std::vector<std::string> &arguments);
