// SPDX-License-Identifier: MIT
#pragma once

#include "warnings.h"

// Everything that is known of a rehearsal, as one JSON object on standard output.
void JsonPrint(const SCENE &scene, const std::vector<WARNING> &warnings);
