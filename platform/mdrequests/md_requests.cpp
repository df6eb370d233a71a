// SPDX-License-Identifier: MIT
//
// Two requests of the appliance's md driver that the stock one lacks, served by a library that is
// preloaded in front of ioctl(). Everything else goes on to the C library untouched.
#include "md_health.h"

#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <dlfcn.h>
#include <linux/major.h>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>

namespace
{

constexpr unsigned long MD_GET_SYNC_STATUS = _IOR(MD_MAJOR, 0x60, MD_SYNC_STATUS);
constexpr unsigned long MD_GET_ARRAY_STATUS = _IOR(MD_MAJOR, 0x61, std::int32_t);

static_assert(sizeof(MD_SYNC_STATUS) == 24, "three 64-bit words without gaps");

// Looked up by device number, so that partitionable and named arrays are found as well.
constexpr const char *MD_DIR_FORMAT = "/sys/dev/block/%u:%u/md";

using IOCTL_FUNCTION = int (*)(int, unsigned long, ...);

enum class LOOKUP { NOT_MD, ABSENT, RUNNING };

LOOKUP ArrayLookup(int fd, MD_ATTRIBUTES *pAttributes)
{
    struct stat info;
    char szMdDir[64];

    if (fstat(fd, &info) != 0 || !S_ISBLK(info.st_mode)) {
        return LOOKUP::NOT_MD;
    }
    std::snprintf(szMdDir, sizeof(szMdDir), MD_DIR_FORMAT, major(info.st_rdev),
                  minor(info.st_rdev));
    if (MdAttributesRead(szMdDir, pAttributes) != 0) {
        return major(info.st_rdev) == MD_MAJOR ? LOOKUP::ABSENT : LOOKUP::NOT_MD;
    }
    return MdIsRunning(pAttributes) ? LOOKUP::RUNNING : LOOKUP::ABSENT;
}

int RequestFail(int error)
{
    errno = error;
    return -1;
}

int RequestAnswer(unsigned long request, const MD_ATTRIBUTES *pAttributes, void *pData)
{
    if (pData == nullptr) {
        return RequestFail(EFAULT);
    }
    if (request == MD_GET_ARRAY_STATUS) {
        *static_cast<std::int32_t *>(pData) = MdHealthGet(pAttributes);
    } else {
        *static_cast<MD_SYNC_STATUS *>(pData) = MdSyncStatusGet(pAttributes);
    }
    return 0;
}

int RequestPass(int fd, unsigned long request, void *pData)
{
    const auto pfnNext = reinterpret_cast<IOCTL_FUNCTION>(dlsym(RTLD_NEXT, "ioctl"));

    return pfnNext == nullptr ? RequestFail(ENOSYS) : pfnNext(fd, request, pData);
}

// What the program starts in turn (mdadm, LVM, ...) shall meet the driver as it is.
__attribute__((constructor)) void PreloadEnd()
{
    unsetenv("LD_PRELOAD");
}

} // namespace

extern "C" __attribute__((visibility("default"))) int ioctl(int fd, unsigned long request,
                                                            ...) noexcept
{
    va_list args;
    va_start(args, request);
    void *pData = va_arg(args, void *);
    va_end(args);

    if (request != MD_GET_ARRAY_STATUS && request != MD_GET_SYNC_STATUS) {
        return RequestPass(fd, request, pData);
    }
    const int savedErrno = errno;
    MD_ATTRIBUTES attributes;
    const LOOKUP lookup = ArrayLookup(fd, &attributes);
    errno = savedErrno;
    switch (lookup) {
    case LOOKUP::NOT_MD:
        return RequestPass(fd, request, pData);
    case LOOKUP::ABSENT:
        return RequestFail(ENODEV);
    case LOOKUP::RUNNING:
        return RequestAnswer(request, &attributes, pData);
    }
    return RequestFail(ENODEV);
}
