// SPDX-License-Identifier: MIT
#pragma once

// Owners of what must be released.

#include <cstdio>
#include <cstdlib>
#include <dirent.h>
#include <memory>
#include <unistd.h>

struct HEAP_DELETER {
    void operator()(char *p) const
    {
        free(p);
    }
};

struct STREAM_DELETER {
    void operator()(FILE *p) const
    {
        (void)fclose(p);
    }
};

struct FOLDER_DELETER {
    void operator()(DIR *p) const
    {
        (void)closedir(p);
    }
};

using HEAP_OWNER = std::unique_ptr<char, HEAP_DELETER>;
using STREAM_OWNER = std::unique_ptr<FILE, STREAM_DELETER>;
using FOLDER_OWNER = std::unique_ptr<DIR, FOLDER_DELETER>;

// A descriptor; -1 is none.
struct DESCRIPTOR {
    int fd = -1;

    explicit DESCRIPTOR(int fdOwned) : fd(fdOwned)
    {
    }
    DESCRIPTOR(const DESCRIPTOR &) = delete;
    DESCRIPTOR &operator=(const DESCRIPTOR &) = delete;
    ~DESCRIPTOR()
    {
        if (fd >= 0) {
            (void)close(fd);
        }
    }
};
