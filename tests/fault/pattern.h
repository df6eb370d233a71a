// SPDX-License-Identifier: MIT
#pragma once

// Extended regular expressions of POSIX, each compiled once.

#include <cstdio>
#include <cstdlib>
#include <map>
#include <memory>
#include <regex.h>
#include <string>

struct PATTERN_FREE {
    void operator()(regex_t *p) const
    {
        regfree(p);
        delete p;
    }
};

inline bool PatternMatches(const std::string &szText, const char *szPattern)
{
    static std::map<std::string, std::unique_ptr<regex_t, PATTERN_FREE>> compiled;
    std::unique_ptr<regex_t, PATTERN_FREE> &pPattern = compiled[szPattern];
    if (pPattern == nullptr) {
        pPattern.reset(new regex_t{});
        if (regcomp(pPattern.get(), szPattern, REG_EXTENDED | REG_NOSUB) != 0) {
            fprintf(stderr, "no regular expression: %s\n", szPattern);
            abort();
        }
    }
    return regexec(pPattern.get(), szText.c_str(), 0, nullptr, 0) == 0;
}
