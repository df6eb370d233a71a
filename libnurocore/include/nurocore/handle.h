// SPDX-License-Identifier: MIT
#pragma once

// What must be released, and how: one deleter a kind, so that no way out of a function leaks.

#include "nurocore/hash.h"
#include "nurocore/pipe.h"
#include "nurocore/szlist.h"

#include <cstdio>
#include <cstdlib>
#include <glob.h>
#include <memory>
#include <mntent.h>
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

struct PIPE_DELETER {
    void operator()(FILE *p) const
    {
        (void)NLIBCPclose(p);
    }
};

struct MOUNT_TABLE_DELETER {
    void operator()(FILE *p) const
    {
        (void)endmntent(p);
    }
};

struct GLOB_DELETER {
    void operator()(glob_t *p) const
    {
        globfree(p);
    }
};

// A list or a table may move while it is held, so its owner holds the address of the pointer.
struct LIST_DELETER {
    void operator()(PNLIBSZLIST *pp) const
    {
        NLIBCSzListFree(*pp);
    }
};

struct HASH_DELETER {
    void operator()(PNLIBHASH *pp) const
    {
        NLIBCHashFree(*pp);
    }
};

// A descriptor in the clothes of a pointer; -1 is none.
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
using PIPE_OWNER = std::unique_ptr<FILE, PIPE_DELETER>;
using MOUNT_TABLE_OWNER = std::unique_ptr<FILE, MOUNT_TABLE_DELETER>;
using GLOB_OWNER = std::unique_ptr<glob_t, GLOB_DELETER>;
using LIST_OWNER = std::unique_ptr<PNLIBSZLIST, LIST_DELETER>;
using HASH_OWNER = std::unique_ptr<PNLIBHASH, HASH_DELETER>;
using FD_OWNER = std::unique_ptr<int, FD_DELETER>;
