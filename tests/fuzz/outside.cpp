// SPDX-License-Identifier: MIT
#include "outside.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <sys/mman.h>
#include <unistd.h>

namespace
{

struct OUTSIDE_FILE {
    const char *szPath;
    std::string_view text;
};

std::array<OUTSIDE_FILE, 8> g_files;
size_t g_nFiles = 0;
std::string_view g_toolOutput;

const OUTSIDE_FILE *FileAt(std::string_view path)
{
    for (size_t i = 0; i < g_nFiles; i++) {
        if (path == g_files[i].szPath) {
            return &g_files[i];
        }
    }
    return nullptr;
}

bool IsFolder(std::string_view path)
{
    for (size_t i = 0; i < g_nFiles; i++) {
        const std::string_view file(g_files[i].szPath);
        if (file.starts_with(path) && file.substr(path.size()).starts_with('/')) {
            return true;
        }
    }
    return false;
}

bool IsOfMachine(std::string_view path)
{
    return path.starts_with("/proc/") || path.starts_with("/sys/") ||
           path.starts_with("/etc.defaults/");
}

struct COOKIE {
    std::string_view rest;
};

ssize_t CookieRead(void *pCookie, char *pBuf, size_t cbBuf)
{
    COOKIE &cookie = *static_cast<COOKIE *>(pCookie);
    const size_t cb = std::min(cbBuf, cookie.rest.size());
    if (cb > 0) {
        memcpy(pBuf, cookie.rest.data(), cb);
        cookie.rest.remove_prefix(cb);
    }
    return static_cast<ssize_t>(cb);
}

int CookieClose(void *pCookie)
{
    delete static_cast<COOKIE *>(pCookie);
    return 0;
}

FILE *StreamOf(std::string_view text)
{
    const cookie_io_functions_t functions = {CookieRead, nullptr, nullptr, CookieClose};
    return fopencookie(new COOKIE{text}, "r", functions);
}

int DescriptorOf(std::string_view text)
{
    const int fd = memfd_create("attribute", MFD_CLOEXEC);
    if (fd >= 0 && (pwrite(fd, text.data(), text.size(), 0) < 0)) {
        abort();
    }
    return fd;
}

// The SCSI hosts of the machine, and one entry that is none.
constexpr const char *HOST_ENTRIES[] = {".", "host0", "host1"};

} // namespace

void OutsideClear()
{
    g_nFiles = 0;
    g_toolOutput = {};
}

void OutsideFile(const char *szPath, std::string_view text)
{
    if (g_nFiles == g_files.size()) {
        abort();
    }
    g_files[g_nFiles++] = {.szPath = szPath, .text = text};
}

void OutsideToolOutput(std::string_view text)
{
    g_toolOutput = text;
}

// ---- what the linker puts in the place of the calls --------------------------------------------

extern "C" {

FILE *__real_fopen64(const char *szPath, const char *szMode);
int __real_open64(const char *szPath, int flags, ...);
int __real_access(const char *szPath, int mode);

FILE *__wrap_fopen64(const char *szPath, const char *szMode);
int __wrap_open64(const char *szPath, int flags, mode_t mode);
int __wrap_access(const char *szPath, int mode);
int __wrap_scandir64(const char *szPath, struct dirent ***pppEntries,
                     int (*pFilter)(const struct dirent *),
                     int (*pCompare)(const struct dirent **, const struct dirent **));
void __wrap_syslog(int priority, const char *szFormat, ...) __attribute__((format(printf, 2, 3)));
FILE *__wrap__Z10NLIBCPopenPKcS0_z(const char *szPath, const char *szMode, ...);
int __wrap__Z11NLIBCPcloseP8_IO_FILE(FILE *pStream);

FILE *__wrap_fopen64(const char *szPath, const char *szMode)
{
    if (const OUTSIDE_FILE *const pFile = FileAt(szPath)) {
        return StreamOf(pFile->text);
    }
    if (IsOfMachine(szPath)) {
        errno = ENOENT;
        return nullptr;
    }
    return __real_fopen64(szPath, szMode);
}

int __wrap_open64(const char *szPath, int flags, mode_t mode)
{
    if (const OUTSIDE_FILE *const pFile = FileAt(szPath)) {
        return DescriptorOf(pFile->text);
    }
    if (IsOfMachine(szPath)) {
        errno = ENOENT;
        return -1;
    }
    return __real_open64(szPath, flags, mode);
}

int __wrap_access(const char *szPath, int mode)
{
    if (!IsOfMachine(szPath)) {
        return __real_access(szPath, mode);
    }
    errno = ENOENT;
    return FileAt(szPath) != nullptr || IsFolder(szPath) ? 0 : -1;
}

int __wrap_scandir64(const char *, struct dirent ***pppEntries, int (*)(const struct dirent *),
                     int (*)(const struct dirent **, const struct dirent **))
{
    auto **const ppEntries =
        static_cast<struct dirent **>(calloc(std::size(HOST_ENTRIES), sizeof(struct dirent *)));
    for (size_t i = 0; i < std::size(HOST_ENTRIES); i++) {
        ppEntries[i] = static_cast<struct dirent *>(calloc(1, sizeof(struct dirent)));
        (void)snprintf(ppEntries[i]->d_name, sizeof(ppEntries[i]->d_name), "%s", HOST_ENTRIES[i]);
    }
    *pppEntries = ppEntries;
    return static_cast<int>(std::size(HOST_ENTRIES));
}

void __wrap_syslog(int, const char *szFormat, ...)
{
    static char szLine[8192];
    va_list arguments;
    va_start(arguments, szFormat);
    (void)vsnprintf(szLine, sizeof(szLine), szFormat, arguments);
    va_end(arguments);
}

FILE *__wrap__Z10NLIBCPopenPKcS0_z(const char *, const char *, ...)
{
    return StreamOf(g_toolOutput);
}

int __wrap__Z11NLIBCPcloseP8_IO_FILE(FILE *pStream)
{
    return fclose(pStream);
}
}
