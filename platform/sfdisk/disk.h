// SPDX-License-Identifier: MIT
#pragma once

// One whole disk, opened and locked: a block device, or an image file.

#include "partition.h"

#include <cstddef>
#include <memory>
#include <sys/types.h>
#include <unistd.h>

// A descriptor that std::unique_ptr can own: empty is -1.
struct DESCRIPTOR {
    int fd = -1;

    DESCRIPTOR(std::nullptr_t = nullptr)
    {
    }
    explicit DESCRIPTOR(int fdOpen) : fd(fdOpen)
    {
    }
    explicit operator bool() const
    {
        return fd >= 0;
    }
    bool operator==(const DESCRIPTOR &) const = default;
};

struct DESCRIPTOR_DELETER {
    using pointer = DESCRIPTOR;
    void operator()(DESCRIPTOR descriptor) const
    {
        close(descriptor.fd);
    }
};

using DESCRIPTOR_OWNER = std::unique_ptr<DESCRIPTOR, DESCRIPTOR_DELETER>;

struct DISK {
    const char *szPath;
    bool fBlock; // false: an image file, of which the kernel knows no partitions
    dev_t device;
    DESCRIPTOR_OWNER file;
    DESCRIPTOR_OWNER claim;
};

// Opens the disk and holds the advisory lock of the whole disk until the program ends, shared
// to read it and exclusive to change it. Everything that scans disks keeps away meanwhile.
int DiskOpen(const char *szPath, bool fWrite, DISK *pDisk);

// Makes sure that nobody uses the disk, as a whole or one of its partitions, and that nobody
// begins to before the program ends.
int DiskClaim(DISK *pDisk);
