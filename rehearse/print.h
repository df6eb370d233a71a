// SPDX-License-Identifier: MIT
#pragma once

#include "warnings.h"

// Prints a rehearsal in the form that the options ask for. Returns the exit status: STATUS_CLEAN,
// or STATUS_WARNED when something speaks against the real run.
int RehearsalPrint(const OPTIONS &options, const HOST &host, const RUN &run);
