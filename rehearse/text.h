// SPDX-License-Identifier: MIT
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

using WORDS = std::vector<std::string>;

// Prints "arrayctl-rehearse: TEXT" to standard error. Always false, so that a caller can return it.
[[gnu::format(printf, 1, 2)]] bool Complain(const char *szFormat, ...);

// The same with ": " and the text of errno behind it.
[[gnu::format(printf, 1, 2)]] bool ComplainErrno(const char *szFormat, ...);

// printf into a string.
[[gnu::format(printf, 1, 2)]] std::string Format(const char *szFormat, ...);

// A whole file, up to 1 MiB of it; nullopt when it cannot be read.
std::optional<std::string> FileRead(const std::string &szPath);

// The file's text without white space at its ends; empty when it cannot be read.
std::string AttributeRead(const std::string &szPath);

// Decimal digits at the beginning of a text; 0 when there are none.
std::uint64_t NumberOf(std::string_view text);

std::string Trimmed(std::string_view text);
WORDS Split(std::string_view text, char separator);
std::string Join(const WORDS &words, std::string_view between);
bool IsOneOf(const WORDS &words, std::string_view word);

// What stands in a folder, sorted by name; empty when it cannot be read.
WORDS FolderList(const std::string &szFolder);

// A word as a person types it into a shell: bare when nothing in it is special, else in quotes.
// Control characters and bytes that are not ASCII are escaped, so that a word never has a line end.
std::string ShellQuoted(const std::string &szWord);
std::string ShellLine(const WORDS &argv);

// A text with quotes, for JSON. Bytes that are not ASCII stand for the characters of that number.
std::string JsonQuoted(std::string_view text);

// "2.4 GiB" of a count of bytes.
std::string SizeText(std::uint64_t cb);
