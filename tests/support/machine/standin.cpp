// SPDX-License-Identifier: MIT
//
// One small static program in the place of every tool: it records how it was called and answers
// from the first row that expects the call and is not used up.

#include "wire.h"

#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <sys/auxv.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <unistd.h>

extern char **environ;

namespace
{

constexpr int STATUS_UNEXPECTED = 125;
constexpr int HIGHEST_DESCRIPTOR = 256;

std::string_view FileRead(const char *szPath)
{
    const int fd = open(szPath, O_RDONLY | O_CLOEXEC);
    struct stat info = {};
    if (fd < 0 || fstat(fd, &info) != 0 || info.st_size == 0) {
        return {};
    }
    const size_t cb = static_cast<size_t>(info.st_size);
    char *const pch = static_cast<char *>(malloc(cb));
    const ssize_t cbRead = pch == nullptr ? -1 : read(fd, pch, cb);
    close(fd);
    return {pch, cbRead < 0 ? 0 : static_cast<size_t>(cbRead)};
}

bool PatternMatches(std::string_view &row, int nArgument, char *const argv[])
{
    const long nPattern = WireNumber(row);
    bool fMatches = true;
    bool fRest = false;
    for (long i = 0; i < nPattern; i++) {
        const std::string_view pattern = WireField(row);
        fRest = fRest || pattern == WIRE_ANY_REST;
        if (fRest || pattern == WIRE_ANY_ARGUMENT) {
            fMatches = fMatches && (fRest || i < nArgument);
            continue;
        }
        fMatches = fMatches && i < nArgument && pattern == argv[i];
    }
    return fMatches && (fRest || nPattern == nArgument);
}

// Takes one of the runs that a row allows; several stand-ins may ask at the same time.
bool UseTake(unsigned int *pUsed, long nTimes)
{
    unsigned int nUsed = __atomic_load_n(pUsed, __ATOMIC_SEQ_CST);
    do {
        if (nTimes >= 0 && nUsed >= static_cast<unsigned long>(nTimes)) {
            return false;
        }
    } while (!__atomic_compare_exchange_n(pUsed, &nUsed, nUsed + 1, false, __ATOMIC_SEQ_CST,
                                          __ATOMIC_SEQ_CST));
    return true;
}

void PathCopy(std::string_view field, char *szPath, size_t cbPath)
{
    snprintf(szPath, cbPath, "%.*s", static_cast<int>(field.size()), field.data());
}

// No path at all is always there.
bool IsThere(std::string_view path)
{
    char szPath[512] = "";
    PathCopy(path, szPath, sizeof(szPath));
    return szPath[0] == '\0' || access(szPath, F_OK) == 0;
}

// Finds the row of this call; `row` then stands at the answer. Where nothing can be written, nobody
// counts, and every call is the first.
bool RowFind(int nArgument, char *const argv[], std::string_view &row)
{
    int fd = open(WIRE_USED, O_RDWR | O_CLOEXEC);
    const int sharing = fd < 0 ? MAP_PRIVATE : MAP_SHARED;
    fd = fd < 0 ? open(WIRE_USED, O_RDONLY | O_CLOEXEC) : fd;
    struct stat info = {};
    if (fd < 0 || fstat(fd, &info) != 0 || info.st_size == 0) {
        return false;
    }
    void *const p =
        mmap(nullptr, static_cast<size_t>(info.st_size), PROT_READ | PROT_WRITE, sharing, fd, 0);
    close(fd);
    if (p == MAP_FAILED) {
        return false;
    }
    unsigned int *pUsed = static_cast<unsigned int *>(p);
    std::string_view rows = FileRead(WIRE_ROWS);
    for (; WireTake(rows, row); pUsed++) {
        const long nTimes = WireNumber(row);
        const bool fNow = IsThere(WireField(row));
        if (PatternMatches(row, nArgument, argv) && fNow && UseTake(pUsed, nTimes)) {
            return true;
        }
    }
    return false;
}

void WireAddNumber(WIRE_RECORD &record, long number)
{
    char szNumber[32] = "";
    snprintf(szNumber, sizeof(szNumber), "%ld", number);
    WireAdd(record, szNumber);
}

bool IsNull(int fd)
{
    struct stat info = {};
    return fstat(fd, &info) == 0 && S_ISCHR(info.st_mode) && info.st_rdev == makedev(1, 3);
}

long DescriptorsCount()
{
    long nOpen = 0;
    for (int fd = STDERR_FILENO + 1; fd < HIGHEST_DESCRIPTOR; fd++) {
        nOpen += fcntl(fd, F_GETFD) != -1;
    }
    return nOpen;
}

void CallRecord(bool fExpected, long nDescriptors, int nArgument, char *const argv[])
{
    static WIRE_RECORD record;
    WireAdd(record, fExpected ? WIRE_COMMAND : WIRE_UNEXPECTED);
    WireAdd(record, reinterpret_cast<const char *>(getauxval(AT_EXECFN)));
    for (int fd = STDIN_FILENO; fd <= STDERR_FILENO; fd++) {
        WireAddNumber(record, IsNull(fd));
    }
    WireAddNumber(record, nDescriptors);
    WireAddNumber(record, nArgument);
    for (int i = 0; i < nArgument; i++) {
        WireAdd(record, argv[i]);
    }
    for (char **psz = environ; *psz != nullptr; psz++) {
        WireAdd(record, *psz);
    }
    WireSend(record);
}

void BytesWrite(int fd, std::string_view bytes)
{
    for (ssize_t cb = 0; !bytes.empty() && (cb = write(fd, bytes.data(), bytes.size())) > 0;) {
        bytes.remove_prefix(static_cast<size_t>(cb));
    }
}

void Flood(size_t cb)
{
    static char achBlock[4096];
    memset(achBlock, 'x', sizeof(achBlock));
    while (cb > 0) {
        const std::string_view block(achBlock, cb < sizeof(achBlock) ? cb : sizeof(achBlock));
        BytesWrite(STDOUT_FILENO, block);
        BytesWrite(STDERR_FILENO, block);
        cb -= block.size();
    }
}

void FoldersMake(char *szPath)
{
    for (char *pch = strchr(szPath + 1, '/'); pch != nullptr; pch = strchr(pch + 1, '/')) {
        *pch = '\0';
        (void)mkdir(szPath, 0755);
        *pch = '/';
    }
}

void FilesWrite(std::string_view &row)
{
    for (long n = WireNumber(row); n > 0; n--) {
        char szPath[512] = "";
        PathCopy(WireField(row), szPath, sizeof(szPath));
        const std::string_view text = WireField(row);
        FoldersMake(szPath);
        // A file is there as a whole or not at all, whenever this process is killed.
        char szNew[64] = "";
        snprintf(szNew, sizeof(szNew), WIRE_FOLDER "/new.%d", getpid());
        const int fd = open(szNew, O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
        if (fd >= 0) {
            BytesWrite(fd, text);
            close(fd);
            (void)rename(szNew, szPath);
        }
    }
}

void FilesRemove(std::string_view &row)
{
    for (long n = WireNumber(row); n > 0; n--) {
        char szPath[512] = "";
        PathCopy(WireField(row), szPath, sizeof(szPath));
        (void)remove(szPath);
    }
}

void GrandchildLeave(long ms)
{
    if (ms > 0 && fork() == 0) {
        (void)usleep(static_cast<useconds_t>(ms) * 1000);
        _exit(0);
    }
}

// Each that comes adds a byte.
void Meet(long nMeet)
{
    constexpr useconds_t LOOK_AGAIN = 1000;
    const int fd = open(WIRE_MEETING, O_WRONLY | O_APPEND | O_CLOEXEC);
    BytesWrite(fd, "+");
    for (struct stat info = {}; fstat(fd, &info) == 0 && info.st_size < nMeet;) {
        (void)usleep(LOOK_AGAIN);
    }
    close(fd);
}

[[noreturn]] void Answer(std::string_view row)
{
    const std::string_view out = WireField(row);
    const std::string_view err = WireField(row);
    const long status = WireNumber(row);
    const long signal = WireNumber(row);
    const long signalCaller = WireNumber(row);
    const long msDelay = WireNumber(row);
    const long nMeet = WireNumber(row);
    const long cbFlood = WireNumber(row);
    GrandchildLeave(WireNumber(row));
    if (nMeet > 0) {
        Meet(nMeet);
    }
    if (msDelay > 0) {
        (void)usleep(static_cast<useconds_t>(msDelay) * 1000);
    }
    FilesWrite(row);
    FilesRemove(row);
    Flood(static_cast<size_t>(cbFlood));
    BytesWrite(STDOUT_FILENO, out);
    BytesWrite(STDERR_FILENO, err);
    if (signalCaller != 0) {
        (void)kill(getppid(), static_cast<int>(signalCaller));
    }
    if (signal != 0) {
        (void)kill(getpid(), static_cast<int>(signal));
    }
    _exit(static_cast<int>(status));
}

// In glibc 2.41 system() gives the shell a "--" before the text, in 2.36 it does not: the same to
// the tests.
int SameForAll(int nArgument, char *argv[])
{
    if (nArgument != 4 || strcmp(argv[1], "-c") != 0 || strcmp(argv[2], "--") != 0) {
        return nArgument;
    }
    argv[2] = argv[3];
    argv[3] = nullptr;
    return nArgument - 1;
}

} // namespace

int main(int argc, char *argv[])
{
    argc = SameForAll(argc, argv);
    const long nDescriptors = DescriptorsCount();
    std::string_view row = {};
    const bool fExpected = RowFind(argc, argv, row);
    CallRecord(fExpected, nDescriptors, argc, argv);
    if (!fExpected) {
        _exit(STATUS_UNEXPECTED);
    }
    Answer(row);
}
