// SPDX-License-Identifier: MIT
#pragma once

// Text in pieces, and files as text.

#include <fstream>
#include <optional>
#include <sstream>
#include <string>
#include <string_view>
#include <vector>

// All that stands between the separators, what is empty too.
inline std::vector<std::string> Split(std::string_view text, char separator)
{
    std::vector<std::string> pieces;
    for (size_t at = 0; at <= text.size(); at += pieces.back().size() + 1) {
        pieces.emplace_back(text.substr(at, text.find(separator, at) - at));
    }
    return pieces;
}

// The lines of a text without their ends.
inline std::vector<std::string> SplitLines(std::string_view text)
{
    std::vector<std::string> lines = Split(text, '\n');
    if (lines.back().empty()) {
        lines.pop_back();
    }
    return lines;
}

// None when it cannot be opened; a folder has no text.
inline std::optional<std::string> FileText(const std::string &szPath)
{
    std::ifstream file(szPath, std::ios::binary);
    std::ostringstream text;
    text << file.rdbuf();
    return file.is_open() ? std::optional(text.str()) : std::nullopt;
}
