// SPDX-License-Identifier: MIT
#pragma once

// Streams and descriptors of the process that a body runs in.

#include <cstdio>
#include <fcntl.h>
#include <string>

inline int DescriptorsCount()
{
    constexpr int HIGHEST_DESCRIPTOR = 64;
    int nOpen = 0;
    for (int fd = 0; fd < HIGHEST_DESCRIPTOR; fd++) {
        nOpen += fcntl(fd, F_GETFD) != -1;
    }
    return nOpen;
}

inline std::string StreamRead(FILE *pStream)
{
    std::string szText;
    for (int ch = fgetc(pStream); ch != EOF; ch = fgetc(pStream)) {
        szText += static_cast<char>(ch);
    }
    return szText;
}
