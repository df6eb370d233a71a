// SPDX-License-Identifier: MIT
#pragma once

// A rehearsal on a machine of the sandbox, whose tools are stand-ins.

#include "sandbox.h"

// Rehearses with these arguments; the tool is the one of the sandbox. Only the rows of questions
// are answered from: where nothing can be written, the first row that fits is every call's.
RUN_RESULT RehearsalTry(MACHINE machine, std::vector<std::string> arguments);
