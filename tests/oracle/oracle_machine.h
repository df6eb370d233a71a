// SPDX-License-Identifier: MIT
#pragma once

// Random machines for the model: the same seed gives the same machine and command everywhere.

#include "oracle_model.h"

#include <cstdint>
#include <string>

struct ORACLE_CASE {
    std::uint64_t seed = 0;
    ORACLE_MACHINE machine{};
    ORACLE_WORDS words{}; // the command, without the program's own name
};

ORACLE_CASE OracleCaseMake(std::uint64_t seed);

// The machine and the command as text for a person.
std::string OracleCaseText(const ORACLE_CASE &subject);
