// SPDX-License-Identifier: MIT
#pragma once

// The traces of a run: its syslog lines and the records of stand-ins and interposing library.

#include "sandbox.h"

// Adds one datagram of the run to the result: a syslog line, or a record of what happened.
void DatagramTake(std::string_view szDatagram, RUN_RESULT &result);

// Compares what the last run did with the machine's rows.
void RowsCompare(const MACHINE &machine, RUN_RESULT &result);

// "Suite.Test" of the running test; "" outside of tests.
std::string TestName();

// Saves all that the program did in the run to the folder ARRAYCTL_TRANSCRIPTS, when that is set,
// so that its behaviour on two processors can be compared.
void TranscriptKeep(const MACHINE &machine, const RUN_RESULT &result);
