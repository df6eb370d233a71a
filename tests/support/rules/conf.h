// SPDX-License-Identifier: MIT
#pragma once

// The configuration file: lines of a key and its value.

#include "text.h"

#include <optional>
#include <strings.h>

inline bool ConfKeyMatches(const std::string &line, const std::string &key)
{
    if (line.starts_with('#') || line.starts_with(';')) {
        return false;
    }
    const size_t first = line.find_first_not_of('=');
    return first != std::string::npos &&
           Trimmed(line.substr(first, line.find('=', first) - first)) == key;
}

// None when nothing stands between the key's "=" and the line's end.
inline std::optional<std::string> ConfValue(const std::string &line)
{
    const size_t key = line.find_first_not_of('=');
    const size_t equals = line.find('=', key);
    if (equals == std::string::npos) {
        return {};
    }
    const size_t first = line.find_first_not_of('\n', equals + 1);
    return first == std::string::npos
               ? std::nullopt
               : std::optional(Trimmed(line.substr(first, line.find('\n', first) - first)));
}

struct CONF_LOOKUP {
    int result = 0; // the bytes that the value takes, 0 for none, -1 when they are too many
    std::string text = {};

    bool IsYes() const
    {
        return result > 0 && strcasecmp(text.c_str(), "yes") == 0;
    }
};

// The first line with the key decides, or the last one. cbValue below 0 only measures.
inline CONF_LOOKUP ConfLookup(std::string_view file, const std::string &key, int cbValue,
                              bool fLast = false)
{
    CONF_LOOKUP lookup;
    bool fForgotten = cbValue < 0;
    int cbNeeded = 0;
    for (const std::string &line : Lines(file)) {
        if (!ConfKeyMatches(line, key)) {
            continue;
        }
        if (const auto value = ConfValue(line)) {
            cbNeeded = static_cast<int>(value->size()) + 1;
            lookup.text = !fForgotten && cbNeeded <= cbValue ? *value : lookup.text;
        } else {
            fForgotten = true;
        }
        if (!fLast) {
            break;
        }
    }
    lookup.result = !fForgotten && cbNeeded > cbValue ? -1 : cbNeeded;
    return lookup;
}
