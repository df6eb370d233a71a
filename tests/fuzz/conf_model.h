// SPDX-License-Identifier: MIT
#pragma once

// The lines of a configuration file once more, with std::string.

#include "fuzz.h"

#include <cstring>
#include <optional>
#include <string>

inline std::string ModelTrim(const std::string &text)
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

inline bool ModelKeyMatch(const std::string &line, const std::string &key)
{
    if (line.starts_with('#') || line.starts_with(';')) {
        return false;
    }
    const size_t first = line.find_first_not_of('=');
    return first != std::string::npos &&
           ModelTrim(line.substr(first, line.find('=', first) - first)) == key;
}

// None when nothing stands between the key's "=" and the line's end.
inline std::optional<std::string> ModelValue(const std::string &line)
{
    const size_t key = line.find_first_not_of('=');
    const size_t equals = line.find('=', key);
    if (equals == std::string::npos) {
        return {};
    }
    const size_t first = line.find_first_not_of('\n', equals + 1);
    return first == std::string::npos
               ? std::nullopt
               : std::optional(ModelTrim(line.substr(first, line.find('\n', first) - first)));
}

struct MODEL_LOOKUP {
    int result = 0; // as the function's
    std::string text = {};
};

// cbValue below 0 is a lookup that only measures.
inline MODEL_LOOKUP ModelLookup(std::string_view file, const std::string &key, int cbValue,
                                bool fLast)
{
    MODEL_LOOKUP lookup;
    bool fForgotten = cbValue < 0;
    int cbNeeded = 0;
    ForEachLine(file, file.size() + 2, [&](const std::string &line) {
        if (!ModelKeyMatch(line, key)) {
            return true;
        }
        if (const auto value = ModelValue(line)) {
            cbNeeded = static_cast<int>(value->size()) + 1;
            lookup.text = !fForgotten && cbNeeded <= cbValue ? *value : lookup.text;
        } else {
            fForgotten = true;
        }
        return fLast;
    });
    lookup.result = !fForgotten && cbNeeded > cbValue ? -1 : cbNeeded;
    return lookup;
}
