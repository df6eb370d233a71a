// SPDX-License-Identifier: MIT
#pragma once

// A rehearsal on a machine of the sandbox, whose tools are stand-ins.

#include "sandbox.h"

// Where the tool of a test stands that has one of its own: a script, see RehearsalToolAdd.
inline constexpr char REHEARSAL_OWN_TOOL[] = "/usr.rehearse/own";
void RehearsalToolAdd(MACHINE &machine, const std::string &szScript);

// Rehearses with these arguments; the tool is the one of the sandbox. Only the rows of questions
// are answered from: where nothing can be written, the first row that fits is every call's.
RUN_RESULT RehearsalTry(MACHINE machine, const std::vector<std::string> &arguments);

// The words that do so when a program of the machine runs them, and what they need there.
std::vector<std::string> RehearsalWords(const std::vector<std::string> &arguments);
void RehearsalAdd(MACHINE &machine);

// The program where it was built.
const char *RehearsalProgram();

// All that a rehearsal may not change: mounts, and every file and folder of the machine with its
// size, rights, time and bytes, one line each.
std::vector<std::string> RehearsalPicture();

// What differs between two of these; empty when nothing does.
std::string RehearsalDifference(const std::vector<std::string> &before,
                                const std::vector<std::string> &after);
