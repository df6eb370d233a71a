// SPDX-License-Identifier: MIT
#pragma once

// The private root: made once per test program, laid out again for every run.

#include "sandbox.h"

#include <string>

// Enters the private namespaces at the first call. If the kernel refuses, the program prints why
// and ends: no test would mean anything.
void PrivateRootEnter();

const std::string &PrivateRootFolder();

// The socket that is the machine's /dev/log.
int PrivateRootLogSocket();

// Empties the private root and lays the machine out in it.
void PrivateRootLayOut(const MACHINE &machine);

// Writes the answers of the stand-ins and the driver, and starts a new transcript. Files are not
// changed.
void PrivateRootAnswersWrite(const MACHINE &machine);
