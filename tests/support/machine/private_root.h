// SPDX-License-Identifier: MIT
#pragma once

// The private root: made once per test program, laid out again for every run.

#include "sandbox.h"

#include <string>

// Enters the private namespaces at the first call. If the kernel refuses, the program prints why
// and ends: no test would mean anything.
void RoomEnter();

const std::string &RoomRoot();

// The socket that is the machine's /dev/log.
int RoomLogSocket();

// Empties the private root and lays the machine out in it.
void RoomLayOut(const MACHINE &machine);

// Writes the answers of the stand-ins and the driver, and starts a new transcript. Files are not
// changed.
void RoomAnswersWrite(const MACHINE &machine);
