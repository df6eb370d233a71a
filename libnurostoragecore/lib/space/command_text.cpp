// SPDX-License-Identifier: MIT
#include "space/command_text.h"

#include <algorithm>
#include <cstring>

void CommandTextBuild(const char *const argv[], size_t cchArgumentMax, char *szText, size_t cbText)
{
    size_t cchText = 0;
    for (size_t i = 0; argv[i] != nullptr && cchText < cbText - 1; i++) {
        if (i > 0) {
            szText[cchText++] = ' ';
        }
        const size_t cchArgument =
            std::min({strlen(argv[i]), cchArgumentMax, cbText - 1 - cchText});
        memcpy(szText + cchText, argv[i], cchArgument);
        cchText += cchArgument;
    }
    szText[cchText] = '\0';
}
