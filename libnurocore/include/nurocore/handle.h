// SPDX-License-Identifier: MIT
#pragma once

// Owners of what libc hands out: one deleter for each kind, so that no return path of a function
// leaks. A type of our own has its owner beside it.

#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <glob.h>
#include <memory>
#include <unistd.h>

struct HEAP_DELETER {
    void operator()(void *p) const
    {
        free(p);
    }
};

struct STREAM_DELETER {
    void operator()(FILE *p) const
    {
        (void)fclose(p); // read-only streams: nothing is lost if this fails
    }
};

struct GLOB_DELETER {
    void operator()(glob_t *p) const
    {
        globfree(p);
    }
};

// A descriptor with what std::unique_ptr asks of a pointer type: the null value is -1, because 0 is
// a descriptor.
struct FD_VALUE {
    int fd = -1;

    FD_VALUE() = default;
    FD_VALUE(std::nullptr_t)
    {
    }
    FD_VALUE(int fdOpen) : fd(fdOpen)
    {
    }
    operator int() const
    {
        return fd;
    }
    explicit operator bool() const
    {
        return fd >= 0;
    }
    friend bool operator==(FD_VALUE a, FD_VALUE b) = default;
};

struct FD_DELETER {
    using pointer = FD_VALUE;
    void operator()(FD_VALUE value) const
    {
        (void)close(value);
    }
};

template <typename T>
using HEAP_OWNER = std::unique_ptr<T, HEAP_DELETER>;
using STREAM_OWNER = std::unique_ptr<FILE, STREAM_DELETER>;
using GLOB_OWNER = std::unique_ptr<glob_t, GLOB_DELETER>;
using FD_OWNER = std::unique_ptr<int, FD_DELETER>;
