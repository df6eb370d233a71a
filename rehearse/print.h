// SPDX-License-Identifier: MIT
#pragma once

#include "warnings.h"

// Prints what is known of a rehearsal in the form that its options ask for.
void ScenePrint(const SCENE &scene, const std::vector<WARNING> &warnings);

// Reads what the machine holds and prints the rehearsal. Returns the exit status: STATUS_CLEAN,
// or STATUS_WARNED when something speaks against the real run.
int RehearsalPrint(const OPTIONS &options, const HOST &host, const RUN &run);
