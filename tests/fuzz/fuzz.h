// SPDX-License-Identifier: MIT
#pragma once

// What every fuzz target shares: a claim that ends the process when it does not hold, and an input
// that can be read as one text or byte by byte.

#include <cstdint>
#include <cstdio>
#include <string>
#include <string_view>
#include <vector>

inline void Claim(bool fHolds, const char *szClaim)
{
    if (!fHolds) {
        (void)fprintf(stderr, "does not hold: %s\n", szClaim);
        __builtin_trap();
    }
}

// Of an input that is a walk: what is checked after each step grows with their number.
constexpr size_t WALK_LENGTH = 240;

inline void ClaimNoDefect(const std::string &defect)
{
    Claim(defect.empty(), defect.c_str());
}

inline std::string_view InputText(const std::uint8_t *pInput, size_t cbInput)
{
    return {reinterpret_cast<const char *>(pInput), cbInput};
}

// Cuts `rest` behind its first `separator` and returns what stood before it.
inline std::string_view TakeUntil(std::string_view &rest, char separator)
{
    const std::string_view taken = rest.substr(0, rest.find(separator));
    rest.remove_prefix(taken.size() < rest.size() ? taken.size() + 1 : taken.size());
    return taken;
}

// The words of a text between any of the separators.
inline std::vector<std::string> Words(std::string_view text, std::string_view separators)
{
    std::vector<std::string> words;
    for (size_t i = text.find_first_not_of(separators); i != std::string_view::npos;
         i = text.find_first_not_of(separators, i)) {
        words.emplace_back(text.substr(i, text.find_first_of(separators, i) - i));
        i += words.back().size();
    }
    return words;
}

// What a function of the C library sees of a text: nothing behind a NUL.
inline std::string CString(std::string_view text)
{
    return std::string(text.substr(0, text.find('\0')));
}

// The lines as fgets hands them out with a buffer of cbLine bytes.
template <typename TAKE>
void ForEachLine(std::string_view text, size_t cbLine, TAKE take)
{
    while (!text.empty()) {
        const size_t cchToEnd = text.find('\n');
        const size_t cchLine = cchToEnd == std::string_view::npos ? text.size() : cchToEnd + 1;
        const std::string_view line = text.substr(0, cchLine < cbLine ? cchLine : cbLine - 1);
        text.remove_prefix(line.size());
        if (!take(CString(line))) {
            return;
        }
    }
}
