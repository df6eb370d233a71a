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
constexpr size_t RECORD_SIZE = 65536;

struct FIELD {
    const char *pch;
    size_t cb;
};

struct READER {
    const char *pch;
    const char *pEnd;
};

bool FieldRead(READER &reader, FIELD &field)
{
    if (reader.pch >= reader.pEnd) {
        return false;
    }
    char *pEnd = nullptr;
    field.cb = strtoul(reader.pch, &pEnd, 10);
    field.pch = pEnd + 1;
    reader.pch = field.pch + field.cb;
    return true;
}

FIELD FieldNext(READER &reader)
{
    FIELD field = {"", 0};
    (void)FieldRead(reader, field);
    return field;
}

// A number's field ends with a blank, so that it stops before the length of the next field.
long NumberNext(READER &reader)
{
    const FIELD field = FieldNext(reader);
    return field.cb == 0 ? 0 : strtol(field.pch, nullptr, 10);
}

bool FieldIs(const FIELD &field, const char *sz)
{
    return field.cb == strlen(sz) && memcmp(field.pch, sz, field.cb) == 0;
}

READER FileRead(const char *szPath)
{
    const int fd = open(szPath, O_RDONLY | O_CLOEXEC);
    struct stat info = {};
    if (fd < 0 || fstat(fd, &info) != 0 || info.st_size == 0) {
        return {"", ""};
    }
    const size_t cb = static_cast<size_t>(info.st_size);
    // Read rather than mapped: numbers are converted up to the byte behind the last one.
    char *const pch = static_cast<char *>(calloc(1, cb + 1));
    const ssize_t cbRead = pch == nullptr ? -1 : read(fd, pch, cb);
    close(fd);
    return cbRead < 0 ? READER{"", ""} : READER{pch, pch + cbRead};
}

bool PatternMatches(READER &row, int nArgument, char *const argv[])
{
    const long nPattern = NumberNext(row);
    bool fMatches = true;
    bool fRest = false;
    for (long i = 0; i < nPattern; i++) {
        const FIELD pattern = FieldNext(row);
        fRest = fRest || FieldIs(pattern, WIRE_ANY_REST);
        if (fRest || FieldIs(pattern, WIRE_ANY_ARGUMENT)) {
            fMatches = fMatches && (fRest || i < nArgument);
            continue;
        }
        fMatches = fMatches && i < nArgument && FieldIs(pattern, argv[i]);
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

void PathCopy(const FIELD &field, char *szPath, size_t cbPath)
{
    snprintf(szPath, cbPath, "%.*s", static_cast<int>(field.cb), field.pch);
}

// No path at all is always there.
bool IsThere(const FIELD &path)
{
    char szPath[512] = "";
    PathCopy(path, szPath, sizeof(szPath));
    return szPath[0] == '\0' || access(szPath, F_OK) == 0;
}

// Finds the row of this call; `row` then stands at the answer.
bool RowFind(int nArgument, char *const argv[], READER &row)
{
    const int fd = open(WIRE_USED, O_RDWR | O_CLOEXEC);
    struct stat info = {};
    if (fd < 0 || fstat(fd, &info) != 0 || info.st_size == 0) {
        return false;
    }
    void *const p =
        mmap(nullptr, static_cast<size_t>(info.st_size), PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0);
    close(fd);
    if (p == MAP_FAILED) {
        return false;
    }
    unsigned int *pUsed = static_cast<unsigned int *>(p);
    READER rows = FileRead(WIRE_ROWS);
    FIELD field = {};
    for (; FieldRead(rows, field); pUsed++) {
        row = {field.pch, field.pch + field.cb};
        const long nTimes = NumberNext(row);
        const bool fNow = IsThere(FieldNext(row));
        if (PatternMatches(row, nArgument, argv) && fNow && UseTake(pUsed, nTimes)) {
            return true;
        }
    }
    return false;
}

struct RECORD {
    size_t cb;
    char ach[RECORD_SIZE];
};

void RecordAdd(RECORD &record, const char *sz)
{
    const int cb =
        snprintf(record.ach + record.cb, sizeof(record.ach) - record.cb, "%zu:%s", strlen(sz), sz);
    record.cb += static_cast<size_t>(cb);
    if (record.cb >= sizeof(record.ach)) {
        record.cb = sizeof(record.ach) - 1; // does not parse any more, which fails the test
    }
}

void RecordAddNumber(RECORD &record, long number)
{
    char szNumber[32] = "";
    snprintf(szNumber, sizeof(szNumber), "%ld", number);
    RecordAdd(record, szNumber);
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
    static RECORD record;
    RecordAdd(record, fExpected ? WIRE_COMMAND : WIRE_UNEXPECTED);
    RecordAdd(record, reinterpret_cast<const char *>(getauxval(AT_EXECFN)));
    for (int fd = STDIN_FILENO; fd <= STDERR_FILENO; fd++) {
        RecordAddNumber(record, IsNull(fd));
    }
    RecordAddNumber(record, nDescriptors);
    RecordAddNumber(record, nArgument);
    for (int i = 0; i < nArgument; i++) {
        RecordAdd(record, argv[i]);
    }
    for (char **psz = environ; *psz != nullptr; psz++) {
        RecordAdd(record, *psz);
    }
    WireSend(record.ach, record.cb);
}

void BytesWrite(int fd, const char *pch, size_t cb)
{
    while (cb > 0) {
        const ssize_t cbWritten = write(fd, pch, cb);
        if (cbWritten <= 0) {
            return;
        }
        pch += cbWritten;
        cb -= static_cast<size_t>(cbWritten);
    }
}

void Flood(size_t cb)
{
    static char achBlock[4096];
    memset(achBlock, 'x', sizeof(achBlock));
    while (cb > 0) {
        const size_t cbNow = cb < sizeof(achBlock) ? cb : sizeof(achBlock);
        BytesWrite(STDOUT_FILENO, achBlock, cbNow);
        BytesWrite(STDERR_FILENO, achBlock, cbNow);
        cb -= cbNow;
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

void FilesWrite(READER &row)
{
    for (long n = NumberNext(row); n > 0; n--) {
        char szPath[512] = "";
        PathCopy(FieldNext(row), szPath, sizeof(szPath));
        const FIELD text = FieldNext(row);
        FoldersMake(szPath);
        // A file is there as a whole or not at all, whenever this process is killed.
        char szNew[64] = "";
        snprintf(szNew, sizeof(szNew), WIRE_FOLDER "/new.%d", getpid());
        const int fd = open(szNew, O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
        if (fd >= 0) {
            BytesWrite(fd, text.pch, text.cb);
            close(fd);
            (void)rename(szNew, szPath);
        }
    }
}

void FilesRemove(READER &row)
{
    for (long n = NumberNext(row); n > 0; n--) {
        char szPath[512] = "";
        PathCopy(FieldNext(row), szPath, sizeof(szPath));
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
    BytesWrite(fd, "+", 1);
    for (struct stat info = {}; fstat(fd, &info) == 0 && info.st_size < nMeet;) {
        (void)usleep(LOOK_AGAIN);
    }
    close(fd);
}

[[noreturn]] void Answer(READER row)
{
    const FIELD out = FieldNext(row);
    const FIELD err = FieldNext(row);
    const long status = NumberNext(row);
    const long signal = NumberNext(row);
    const long signalCaller = NumberNext(row);
    const long msDelay = NumberNext(row);
    const long nMeet = NumberNext(row);
    const long cbFlood = NumberNext(row);
    GrandchildLeave(NumberNext(row));
    if (nMeet > 0) {
        Meet(nMeet);
    }
    if (msDelay > 0) {
        (void)usleep(static_cast<useconds_t>(msDelay) * 1000);
    }
    FilesWrite(row);
    FilesRemove(row);
    Flood(static_cast<size_t>(cbFlood));
    BytesWrite(STDOUT_FILENO, out.pch, out.cb);
    BytesWrite(STDERR_FILENO, err.pch, err.cb);
    if (signalCaller != 0) {
        (void)kill(getppid(), static_cast<int>(signalCaller));
    }
    if (signal != 0) {
        (void)kill(getpid(), static_cast<int>(signal));
    }
    _exit(static_cast<int>(status));
}

} // namespace

int main(int argc, char *argv[])
{
    const long nDescriptors = DescriptorsCount();
    READER row = {};
    const bool fExpected = RowFind(argc, argv, row);
    CallRecord(fExpected, nDescriptors, argc, argv);
    if (!fExpected) {
        _exit(STATUS_UNEXPECTED);
    }
    Answer(row);
}
