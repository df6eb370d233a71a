// SPDX-License-Identifier: MIT
#pragma once

// What a walk over a container does, and the first thing that does not hold on its way.

#include <random>
#include <string>
#include <string_view>

// Bytes as a series of decisions; all zero at their end.
struct DECISIONS {
    std::string_view rest;

    int Below(int n)
    {
        if (rest.empty()) {
            return 0;
        }
        const int byte = static_cast<unsigned char>(rest.front());
        rest.remove_prefix(1);
        return byte % n;
    }
    // Few letters, so that equals and neighbours come often; never empty, long ones seldom.
    std::string Text(std::string_view letters)
    {
        const int length = Below(256);
        const int cch = length < 250 ? 1 + length % 5 : 1 + (length - 249) * 50;
        std::string text;
        for (int i = 0; i < cch; i++) {
            const int letter = cch <= 5 ? Below(static_cast<int>(letters.size())) : i;
            text += letters[static_cast<size_t>(letter) % letters.size()];
        }
        return text;
    }
};

// Empty as long as everything holds.
inline void Hold(std::string &defect, bool fHolds, const char *szClaim)
{
    if (defect.empty() && !fHolds) {
        defect = szClaim;
    }
}

// A walk that takes its own way.
inline std::string RandomBytes(std::mt19937 &random, size_t cb)
{
    std::string bytes(cb, '\0');
    for (char &byte : bytes) {
        byte = static_cast<char>(random() & 0xff);
    }
    return bytes;
}
