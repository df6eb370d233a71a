// SPDX-License-Identifier: MIT
#pragma once

#include "text.h"

// True when this process was started in the place of one of the tool's programs.
bool RecorderIsWanted();

// Whether an argument list is one of the questions: what is not known as one is a command.
bool RecorderIsQuestion(const WORDS &argv);

// Passes a question on to the real program and writes everything else down. Returns the exit
// status: that of the real program, or 0 for what was written down.
int RecorderRun(int argc, char **argv);
