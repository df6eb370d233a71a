// SPDX-License-Identifier: MIT
#pragma once

// Extended regular expressions of POSIX, each compiled once.

#include <cstdio>
#include <cstdlib>
#include <map>
#include <regex.h>
#include <string>

inline bool PatternMatches(const std::string &szText, const char *szPattern)
{
    static std::map<std::string, regex_t> compiled;
    auto found = compiled.find(szPattern);
    if (found == compiled.end()) {
        found = compiled.emplace(szPattern, regex_t{}).first;
        if (regcomp(&found->second, szPattern, REG_EXTENDED | REG_NOSUB) != 0) {
            fprintf(stderr, "no regular expression: %s\n", szPattern);
            abort();
        }
    }
    return regexec(&found->second, szText.c_str(), 0, nullptr, 0) == 0;
}
