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

// In double quotes, with what cannot stand in them as it is escaped.
inline std::string Quoted(std::string_view text)
{
    constexpr std::string_view ESCAPED = "\n\r\t\"\\";
    constexpr std::string_view LETTERS = "nrt\"\\";
    std::string quoted = "\"";
    for (const char ch : text) {
        const size_t i = ESCAPED.find(ch);
        quoted += i == std::string_view::npos ? std::string(1, ch) : std::string{'\\', LETTERS[i]};
    }
    return quoted + "\"";
}

// An argument list with blanks between; an argument is quoted that would not be seen as one.
inline std::string WordsText(const std::vector<std::string> &words)
{
    std::string text;
    for (const std::string &szWord : words) {
        const bool fPlain = szWord.find_first_of(" \t\n\"\\") == std::string::npos;
        text += (text.empty() ? "" : " ") + (fPlain && !szWord.empty() ? szWord : Quoted(szWord));
    }
    return text;
}

// None when it cannot be opened; a folder has no text.
inline std::optional<std::string> FileText(const std::string &szPath)
{
    std::ifstream file(szPath, std::ios::binary);
    std::ostringstream text;
    text << file.rdbuf();
    return file.is_open() ? std::optional(text.str()) : std::nullopt;
}
