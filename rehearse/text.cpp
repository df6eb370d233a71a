// SPDX-License-Identifier: MIT
#include "text.h"

#include "owner.h"
#include "places.h"

#include <algorithm>
#include <cerrno>
#include <cstdarg>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <iterator>
#include <optional>
#include <string>
#include <string_view>

namespace
{

constexpr size_t FILE_SIZE_MAX = 1048576;
constexpr size_t MESSAGE_SIZE = 1024;
constexpr char BLANKS[] = " \t\r\n";
constexpr char BARE_CHARACTERS[] = "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789"
                                   "_-+=:,./@%";

bool IsPlain(char ch)
{
    return ch >= ' ' && ch <= '~';
}

[[gnu::format(printf, 1, 0)]] std::string FormatList(const char *szFormat, va_list arguments)
{
    char *szText = nullptr;
    const int cch = vasprintf(&szText, szFormat, arguments);
    const HEAP_OWNER owner(cch < 0 ? nullptr : szText);
    return cch < 0 ? std::string() : std::string(szText);
}

void MessagePrint(const std::string &szText)
{
    (void)fprintf(stderr, "%s: %s\n", PROGRAM_NAME, szText.c_str());
}

} // namespace

bool Complain(const char *szFormat, ...)
{
    va_list arguments;
    va_start(arguments, szFormat);
    MessagePrint(FormatList(szFormat, arguments));
    va_end(arguments);
    return false;
}

bool ComplainErrno(const char *szFormat, ...)
{
    const std::string szReason = strerror(errno);
    va_list arguments;
    va_start(arguments, szFormat);
    MessagePrint(FormatList(szFormat, arguments) + ": " + szReason);
    va_end(arguments);
    return false;
}

std::string Format(const char *szFormat, ...)
{
    va_list arguments;
    va_start(arguments, szFormat);
    std::string szText = FormatList(szFormat, arguments);
    va_end(arguments);
    return szText;
}

std::optional<std::string> FileRead(const std::string &szPath)
{
    const STREAM_OWNER pFile(fopen(szPath.c_str(), "re"));
    if (pFile == nullptr) {
        return std::nullopt;
    }
    std::string szText;
    char ach[MESSAGE_SIZE];
    // Less than was asked for is the end, or a failure.
    for (size_t cb = sizeof(ach); cb == sizeof(ach) && szText.size() < FILE_SIZE_MAX;) {
        cb = fread(ach, 1, sizeof(ach), pFile.get());
        szText.append(ach, cb);
    }
    if (ferror(pFile.get()) != 0) {
        return std::nullopt;
    }
    return szText;
}

std::string AttributeRead(const std::string &szPath)
{
    return Trimmed(FileRead(szPath).value_or(""));
}

std::uint64_t NumberOf(std::string_view text)
{
    std::uint64_t number = 0;
    for (const char ch : text) {
        if (ch < '0' || ch > '9') {
            break;
        }
        number = number * 10 + static_cast<std::uint64_t>(ch - '0');
    }
    return number;
}

std::string Trimmed(std::string_view text)
{
    const size_t iFirst = text.find_first_not_of(BLANKS);
    if (iFirst == std::string_view::npos) {
        return "";
    }
    return std::string(text.substr(iFirst, text.find_last_not_of(BLANKS) - iFirst + 1));
}

WORDS Split(std::string_view text, char separator)
{
    WORDS words;
    for (size_t iStart = 0; iStart <= text.size();) {
        const size_t iEnd = std::min(text.find(separator, iStart), text.size());
        words.emplace_back(text.substr(iStart, iEnd - iStart));
        iStart = iEnd + 1;
    }
    return words;
}

std::string Join(const WORDS &words, std::string_view between)
{
    std::string szAll;
    for (const std::string &szWord : words) {
        szAll += szAll.empty() ? "" : between;
        szAll += szWord;
    }
    return szAll;
}

bool IsOneOf(const WORDS &words, std::string_view word)
{
    return std::find(words.begin(), words.end(), word) != words.end();
}

WORDS FolderList(const std::string &szFolder)
{
    WORDS names;
    const FOLDER_OWNER pFolder(opendir(szFolder.c_str()));
    if (pFolder == nullptr) {
        return names;
    }
    for (const dirent *pEntry = readdir(pFolder.get()); pEntry != nullptr;
         pEntry = readdir(pFolder.get())) {
        const std::string szName = pEntry->d_name;
        if (szName != "." && szName != "..") {
            names.push_back(szName);
        }
    }
    std::sort(names.begin(), names.end());
    return names;
}

std::string ShellQuoted(const std::string &szWord)
{
    if (!szWord.empty() && szWord.find_first_not_of(BARE_CHARACTERS) == std::string::npos) {
        return szWord;
    }
    if (std::all_of(szWord.begin(), szWord.end(), IsPlain)) {
        std::string szQuoted = "'";
        for (const char ch : szWord) {
            szQuoted += ch == '\'' ? std::string("'\\''") : std::string(1, ch);
        }
        return szQuoted + "'";
    }
    std::string szQuoted = "$'";
    for (const char ch : szWord) {
        if (ch == '\'' || ch == '\\') {
            szQuoted += '\\';
        }
        szQuoted += IsPlain(ch)
                        ? std::string(1, ch)
                        : Format("\\%03o", static_cast<unsigned>(static_cast<unsigned char>(ch)));
    }
    return szQuoted + "'";
}

std::string ShellLine(const WORDS &argv)
{
    WORDS quoted;
    for (const std::string &szWord : argv) {
        quoted.push_back(ShellQuoted(szWord));
    }
    return Join(quoted, " ");
}

std::string JsonQuoted(std::string_view text)
{
    std::string szQuoted = "\"";
    for (const char ch : text) {
        if (ch == '"' || ch == '\\') {
            szQuoted += '\\';
        }
        szQuoted += IsPlain(ch)
                        ? std::string(1, ch)
                        : Format("\\u%04x", static_cast<unsigned>(static_cast<unsigned char>(ch)));
    }
    return szQuoted + '"';
}

std::string SizeText(std::uint64_t cb)
{
    constexpr const char *UNITS[] = {"bytes", "KiB", "MiB", "GiB", "TiB", "PiB"};
    constexpr std::uint64_t STEP = 1024;
    size_t iUnit = 0;
    std::uint64_t cbUnit = 1;
    while (iUnit + 1 < std::size(UNITS) && cb / cbUnit >= STEP) {
        cbUnit *= STEP;
        iUnit++;
    }
    if (iUnit == 0) {
        return Format("%llu bytes", static_cast<unsigned long long>(cb));
    }
    const std::uint64_t whole = cb / cbUnit;
    const std::uint64_t tenth = cb % cbUnit * 10 / cbUnit;
    return Format("%llu.%llu %s", static_cast<unsigned long long>(whole),
                  static_cast<unsigned long long>(tenth), UNITS[iUnit]);
}
