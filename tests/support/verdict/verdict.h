// SPDX-License-Identifier: MIT
#pragma once

// Outcomes as verdict.py has them, told by test programs that are not GoogleTest's.
#include <cstddef>
#include <string>

// Prints "ok NAME", or "FAILED NAME" with what is wrong indented below it. A note is a remark that
// is no part of the name.
void VerdictTell(const std::string &szName, const std::string &szWrong,
                 const std::string &szNote = {});

// Whether a test of that name was asked for: the filter is a part of the name, or a pattern as of
// files; an empty one takes everything.
bool VerdictWanted(const std::string &szName, const std::string &szFilter);

// As many as there are processors.
size_t VerdictWorkers();

// Milliseconds that something may be silent until it counts as hanging; see silence.sh.
int VerdictSilence();
