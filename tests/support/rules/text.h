// SPDX-License-Identifier: MIT
#pragma once

// Text as the second reading of the rules takes it apart. Nothing of these rules is shared with the
// tool and its libraries.

#include <algorithm>
#include <climits>
#include <cstdlib>
#include <string>
#include <string_view>
#include <vector>

// What a function of the C library sees of a text: nothing behind a NUL.
inline std::string CString(std::string_view text)
{
    return std::string(text.substr(0, text.find('\0')));
}

// Without white space at its ends, and without one pair of quotes around the rest.
inline std::string Trimmed(const std::string &text)
{
    constexpr char WHITE_SPACE[] = " \t\r\n";
    const size_t first = text.find_first_not_of(WHITE_SPACE);
    if (first == std::string::npos) {
        return "";
    }
    const std::string bare = text.substr(first, text.find_last_not_of(WHITE_SPACE) - first + 1);
    const bool fQuoted = bare.size() > 1 && bare.front() == '"' && bare.back() == '"';
    return fQuoted ? bare.substr(1, bare.size() - 2) : bare;
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

// The lines with their ends, as fgets hands them out with a buffer of cbLine bytes.
inline std::vector<std::string> Lines(std::string_view text, size_t cbLine = SIZE_MAX)
{
    std::vector<std::string> lines;
    while (!text.empty()) {
        const size_t cchToEnd = std::min(text.find('\n'), text.size() - 1) + 1;
        const std::string_view line = text.substr(0, std::min(cchToEnd, cbLine - 1));
        text.remove_prefix(line.size());
        lines.push_back(CString(line));
    }
    return lines;
}

// Empty when there is none.
inline std::string FirstLine(std::string_view text, size_t cbLine)
{
    return CString(text.substr(0, std::min(text.find('\n'), cbLine - 2) + 1));
}

// A decimal number, as far as 32 bits go.
inline int Number32(const std::string &text)
{
    const long value = strtol(text.c_str(), nullptr, 10);
    return static_cast<int>(std::clamp<long>(value, INT_MIN, INT_MAX));
}

inline std::string WithoutDev(const std::string &path)
{
    return path.starts_with("/dev/") ? path.substr(5) : path;
}
