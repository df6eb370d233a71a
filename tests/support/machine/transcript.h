// SPDX-License-Identifier: MIT
#pragma once

// What a run left: its syslog lines and the records of stand-ins and interposing library.

#include "sandbox.h"

// Adds one datagram of the run to the result: a syslog line, or a record of what happened.
void DatagramTake(std::string_view szDatagram, RUN_RESULT &result);

// Compares what the last run did with the machine's rows.
void RowsCompare(const MACHINE &machine, RUN_RESULT &result);

// "Suite.Test" of the test that runs; "" outside of tests.
std::string TestName();

// Puts all that the program did in the run into the folder ARRAYCTL_TRANSCRIPTS, when there is one,
// so that its behaviour on two processors can be compared.
void TranscriptKeep(const MACHINE &machine, const RUN_RESULT &result);
