// SPDX-License-Identifier: MIT
#include "disk.h"
#include "partition.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>

namespace
{

// A program that probes a disk holds its lock only for a moment, not for five seconds.
constexpr int LOCK_TRIES = 250;
constexpr timespec LOCK_PAUSE = {0, 20'000'000};

bool IsPartition(dev_t device)
{
    char szPath[64];
    snprintf(szPath, sizeof(szPath), "/sys/dev/block/%u:%u/partition", major(device),
             minor(device));
    return access(szPath, F_OK) == 0;
}

int DiskKindCheck(const struct stat &status, DISK *pDisk)
{
    pDisk->fBlock = S_ISBLK(status.st_mode);
    pDisk->device = status.st_rdev;
    if (!pDisk->fBlock && !S_ISREG(status.st_mode)) {
        return Complain("%s is no disk", pDisk->szPath);
    }
    if (pDisk->fBlock && IsPartition(pDisk->device)) {
        return Complain("%s is a partition, no disk", pDisk->szPath);
    }
    return 0;
}

int DiskLock(const DISK *pDisk, int mode)
{
    for (int i = 0; i < LOCK_TRIES; i++) {
        if (flock(pDisk->file.get().fd, mode | LOCK_NB) == 0) {
            return 0;
        }
        if (errno != EWOULDBLOCK && errno != EINTR) {
            return Complain("cannot lock %s: %s", pDisk->szPath, strerror(errno));
        }
        nanosleep(&LOCK_PAUSE, nullptr);
    }
    return Complain("%s is locked by another program", pDisk->szPath);
}

} // namespace

int DiskOpen(const char *szPath, bool fWrite, DISK *pDisk)
{
    struct stat status = {};

    pDisk->szPath = szPath;
    // Checked before it is opened: opening a tape, a pipe or a terminal is not harmless.
    if (stat(szPath, &status) != 0) {
        return Complain("cannot open %s: %s", szPath, strerror(errno));
    }
    if (DiskKindCheck(status, pDisk) != 0) {
        return 1;
    }
    const int fdFile = open(szPath, (fWrite ? O_RDWR : O_RDONLY) | O_CLOEXEC);
    if (fdFile < 0) {
        return Complain("cannot open %s: %s", szPath, strerror(errno));
    }
    pDisk->file.reset(DESCRIPTOR{fdFile});
    return DiskLock(pDisk, fWrite ? LOCK_EX : LOCK_SH);
}

int DiskClaim(DISK *pDisk)
{
    if (!pDisk->fBlock) {
        return 0;
    }
    // A partition that is open exclusively makes this fail, too.
    const int fdClaim = open(pDisk->szPath, O_RDONLY | O_EXCL | O_CLOEXEC);
    if (fdClaim < 0) {
        return Complain(errno == EBUSY ? "%s is in use" : "cannot claim %s", pDisk->szPath);
    }
    pDisk->claim.reset(DESCRIPTOR{fdClaim});
    return 0;
}
