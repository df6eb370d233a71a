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
// to read it and exclusive to change it. Programs that scan disks respect that lock.
int DiskOpen(const char *szPath, bool fWrite, DISK *pDisk);

// Makes sure that neither the whole disk nor one of its partitions is in use, and that this stays
// so until the program ends. Does nothing for an image file.
int DiskClaim(DISK *pDisk);
