// SPDX-License-Identifier: MIT
#pragma once

// The private root: made once a test program, laid out anew for every run.

#include "sandbox.h"

#include <string>

// Goes into the private namespaces at the first call. Where the kernel refuses, the program ends
// and says why: no test would mean anything.
void RoomEnter();

const std::string &RoomRoot();

// The socket that is the machine's /dev/log.
int RoomLogSocket();

// Empties the private root and lays the machine out in it.
void RoomLayOut(const MACHINE &machine);

// Writes what stand-ins and driver answer, and starts a new transcript; files are left alone.
void RoomAnswersWrite(const MACHINE &machine);
