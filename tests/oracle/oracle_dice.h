// SPDX-License-Identifier: MIT
#pragma once

// Throws of the dice. The distributions of <random> may differ from one library to the next; its
// engine may not.

#include <cstdint>
#include <random>
#include <vector>

using DICE = std::mt19937_64;

inline std::uint64_t Below(DICE &dice, std::uint64_t limit)
{
    return dice() % limit;
}

inline bool Chance(DICE &dice, std::uint64_t percent)
{
    return Below(dice, 100) < percent;
}

template <typename T>
const T &Pick(DICE &dice, const std::vector<T> &items)
{
    return items[Below(dice, items.size())];
}
