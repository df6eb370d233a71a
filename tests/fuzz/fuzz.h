// SPDX-License-Identifier: MIT
#pragma once

// What every fuzz target shares: its entry, a claim that ends the process when it does not hold,
// and the machine that the libraries see.

#include "outside.h"

#include <cstdint>
#include <cstdio>
#include <string>
#include <string_view>

inline void Claim(bool fHolds, const char *szClaim)
{
    if (!fHolds) {
        (void)fprintf(stderr, "does not hold: %s\n", szClaim);
        __builtin_trap();
    }
}

// Of an input that is a walk: what is checked after each step grows with their number.
constexpr size_t WALK_LENGTH = 240;

// Cuts `rest` behind its first `separator` and returns what stood before it.
inline std::string_view TakeUntil(std::string_view &rest, char separator)
{
    const std::string_view taken = rest.substr(0, rest.find(separator));
    rest.remove_prefix(taken.size() < rest.size() ? taken.size() + 1 : taken.size());
    return taken;
}

// The target: what must hold of any input. It begins on a machine without files.
void Fuzz(std::string_view input);

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *pInput, size_t cbInput)
{
    OutsideClear();
    Fuzz({reinterpret_cast<const char *>(pInput), cbInput});
    return 0;
}
