// SPDX-License-Identifier: MIT
#include "attribute/attribute.h"

#include "nurocore/handle.h"
#include "nurocore/io.h"

#include <cstring>
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
    szText[0] = '\0';
    while (cbMore > 0 && cbRead < cbText - 1 && strchr(szText, '\n') == nullptr) {
        cbMore = NLIBCRead(fd.get(), szText + cbRead, cbText - 1 - cbRead);
        if (cbMore < 0) {
            return ATTRIBUTE_NOT_READ;
        }
        cbRead += static_cast<size_t>(cbMore);
        szText[cbRead] = '\0';
    }
    return static_cast<ssize_t>(cbRead);
}

ssize_t AttributeLineRead(const char *szFile, char *szText, size_t cbText)
{
    const ssize_t cbRead = AttributeRead(szFile, szText, cbText);
    char *const pchEnd = cbRead <= ATTRIBUTE_NOT_READ ? nullptr : strchr(szText, '\n');
    if (pchEnd != nullptr) {
        pchEnd[1] = '\0';
    }
    return cbRead;
}
