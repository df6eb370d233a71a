// SPDX-License-Identifier: MIT
#pragma once

// What a run left: its syslog lines and the records of stand-ins and interposing library.

#include "sandbox.h"

LOG_LINE LogLineParse(std::string_view szDatagram);

// Reads the records of the last run into the result, and compares them with the machine's rows.
void TranscriptTake(const MACHINE &machine, RUN_RESULT &result);
