// SPDX-License-Identifier: MIT
#include "space/command_text.h"

#include "nurocore/text.h"

#include <algorithm>
#include <cstddef>

void CommandTextBuild(const char *const argv[], size_t cchArgumentMax, char *szText, size_t cbText)
{
    size_t cchText = 0;
    szText[0] = '\0';
    for (size_t i = 0; argv[i] != nullptr; i++) {
        if (i > 0) {
            cchText = NLIBCStrAppend(szText, cbText, " ");
        }
        // A buffer that ends earlier cuts the argument.
        const size_t cbHere = std::min(cbText, cchText + cchArgumentMax + 1);
        cchText = NLIBCStrAppend(szText, cbHere, argv[i]);
    }
}
