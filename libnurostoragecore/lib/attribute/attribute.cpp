// SPDX-License-Identifier: MIT
#include "attribute/attribute.h"

#include "nurocore/handle.h"
#include "nurocore/io.h"

#include <algorithm>
#include <fcntl.h>

ssize_t AttributeRead(const char *szFile, char *szText, size_t cbText)
{
    const FD_OWNER fd(open(szFile, O_RDONLY | O_CLOEXEC));
    if (!fd) {
        return ATTRIBUTE_NOT_OPENED;
    }
    // sysfs returns a line in one read; a file of another kind may need several.
    size_t cbRead = 0;
    ssize_t cbMore = 1;
    const char *pchEnd = szText;
    while (cbMore > 0 && cbRead < cbText - 1) {
        cbMore = NLIBCRead(fd.get(), szText + cbRead, cbText - 1 - cbRead);
        if (cbMore < 0) {
            return ATTRIBUTE_NOT_READ;
        }
        cbRead += static_cast<size_t>(cbMore);
        const char *const pchRead = szText + cbRead;
        pchEnd = std::find(pchEnd, pchRead, '\n');
        if (pchEnd != pchRead) {
            pchEnd++;
            break;
        }
    }
    szText[pchEnd - szText] = '\0';
    return static_cast<ssize_t>(cbRead);
}
