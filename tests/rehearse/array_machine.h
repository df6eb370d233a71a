// SPDX-License-Identifier: MIT
#pragma once

// Random machines with arrays, and a command that looks for one of them: the same seed gives the
// same machine everywhere.

#include "sandbox.h"

#include <cstdint>
#include <string>
#include <vector>

struct ARRAY_CASE {
    MACHINE machine{};
    std::vector<std::string> words{}; // destroy or status, and a number
    bool fStops = false;              // an array that is there and running is taken apart
};

ARRAY_CASE ArrayCaseMake(std::uint64_t seed);

// The command and the machine as text for a person.
std::string ArrayCaseText(const ARRAY_CASE &subject);
