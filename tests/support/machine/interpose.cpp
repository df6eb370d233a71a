// SPDX-License-Identifier: MIT
//
// Stands between the program and the C library: answers the requests on device nodes, tells their
// device numbers, turns sleeps into records, and makes a chosen call fail. Preloaded into the
// program, and linked into the test program, where it sleeps until a body runs inside a machine.
//
// Everything here must work while malloc itself is what fails, so nothing allocates.

#include "interpose.h"
#include "wire.h"

#include <cerrno>
#include <csignal>
#include <cstdarg>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <dirent.h>
#include <dlfcn.h>
#include <fcntl.h>
#include <glob.h>
#include <linux/fs.h>
#include <linux/major.h>
#include <linux/types.h>
#include <mntent.h>
#include <sys/ioctl.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/sysmacros.h>
#include <unistd.h>

#include <linux/raid/md_u.h>

// Present in programs that count what runs.
extern "C" void __gcov_dump() __attribute__((weak));

namespace
{

constexpr size_t DRIVER_SIZE = 65536;
constexpr size_t DEVICES = 64;
constexpr size_t FAULTS = 16;
constexpr size_t ARRAY_INFO_WORDS = sizeof(mdu_array_info_t) / sizeof(int);

struct SYNC_ANSWER {
    std::uint64_t activity;
    std::uint64_t done;
    std::uint64_t total;
};

constexpr unsigned long REQUEST_HEALTH = _IOR(MD_MAJOR, 0x61, int);
constexpr unsigned long REQUEST_SYNC = _IOR(MD_MAJOR, 0x60, SYNC_ANSWER);

struct DEVICE {
    const char *szPath;
    bool fArray;
    unsigned int deviceMajor;
    unsigned int deviceMinor;
    int errnoInfo;
    int info[ARRAY_INFO_WORDS];
    int errnoSize;
    std::uint64_t cb;
    int errnoHealth;
    int health;
    int errnoSync;
    SYNC_ANSWER sync;
};

struct FAULT {
    const char *szFunction;
    int nCall;
    int error;
    bool fGoOn;
    const char *szProcess;
    int nSeen;
};

// Which file a stream was opened on, so that a failed read can be told by its file.
struct STREAM_NAME {
    const FILE *pStream;
    char szPath[96];
};

struct FILE_NAME {
    int fd;
    char szPath[sizeof(STREAM_NAME::szPath)];
};

constexpr size_t STREAM_NAMES = 16;
constexpr size_t PROCESS_NAME_SIZE = 32;
constexpr char ANY_CALL[] = "*";
constexpr char ANY_PROCESS[] = "*";
constexpr char NO_OBJECT[] = "-";

char g_achDriver[DRIVER_SIZE];
DEVICE g_devices[DEVICES];
size_t g_nDevice = 0;
FAULT g_faults[FAULTS];
size_t g_nFault = 0;
bool g_fActive = false;
bool g_fRealSleep = false;
std::int64_t g_when = 0;
bool g_fCallsTold = false;
STREAM_NAME g_streamNames[STREAM_NAMES];
FILE_NAME g_fileName = {-1, ""};
size_t g_nStreamName = 0;

// "0" is the program, "0.2" the second process that it forked, "0.2.1" the first one of that.
char g_szProcess[PROCESS_NAME_SIZE] = "0";
int g_nFork = 0;

// ---- the driver file ---------------------------------------------------------------------------

struct READER {
    char *pch;
    char *pEnd;
};

// The next field. Every field of this file ends with a blank, so that a number stops before the
// length of the next field.
char *FieldNext(READER &reader, READER *pInner)
{
    static char szNone[] = "";
    if (reader.pch >= reader.pEnd) {
        return szNone;
    }
    char *pStart = nullptr;
    const unsigned long cb = strtoul(reader.pch, &pStart, 10);
    pStart++;
    reader.pch = pStart + cb;
    if (pInner != nullptr) {
        *pInner = {pStart, reader.pch};
    }
    return pStart;
}

std::uint64_t NumberNext(READER &reader)
{
    return strtoull(FieldNext(reader, nullptr), nullptr, 10);
}

int WordNext(READER &reader)
{
    return static_cast<int>(strtol(FieldNext(reader, nullptr), nullptr, 10));
}

char *TextNext(READER &reader)
{
    char *const pch = FieldNext(reader, nullptr);
    char *const pBlank = strchr(pch, ' ');
    if (pBlank != nullptr) {
        *pBlank = '\0';
    }
    return pch;
}

void DeviceTake(READER reader)
{
    if (g_nDevice == DEVICES) {
        abort();
    }
    DEVICE &device = g_devices[g_nDevice++];
    device.szPath = TextNext(reader);
    device.fArray = WordNext(reader) != 0;
    device.deviceMajor = static_cast<unsigned int>(WordNext(reader));
    device.deviceMinor = static_cast<unsigned int>(WordNext(reader));
    device.errnoInfo = WordNext(reader);
    for (int &word : device.info) {
        word = WordNext(reader);
    }
    device.errnoSize = WordNext(reader);
    device.cb = NumberNext(reader);
    device.errnoHealth = WordNext(reader);
    device.health = WordNext(reader);
    device.errnoSync = WordNext(reader);
    device.sync.activity = NumberNext(reader);
    device.sync.done = NumberNext(reader);
    device.sync.total = NumberNext(reader);
}

void FaultTake(READER reader)
{
    if (g_nFault == FAULTS) {
        abort();
    }
    FAULT &fault = g_faults[g_nFault++];
    fault.szFunction = TextNext(reader);
    fault.nCall = WordNext(reader);
    fault.error = WordNext(reader);
    fault.fGoOn = WordNext(reader) != 0;
    fault.szProcess = TextNext(reader);
    fault.nSeen = 0;
}

bool DriverRead()
{
    const long fd = syscall(SYS_openat, AT_FDCWD, WIRE_DRIVER, O_RDONLY | O_CLOEXEC);
    if (fd < 0) {
        return false;
    }
    const long cb = syscall(SYS_read, fd, g_achDriver, sizeof(g_achDriver) - 1);
    (void)syscall(SYS_close, fd);
    READER reader = {g_achDriver, g_achDriver + (cb < 0 ? 0 : cb)};
    while (reader.pch < reader.pEnd) {
        READER record = {};
        (void)FieldNext(reader, &record);
        const char *const szKind = TextNext(record);
        if (strcmp(szKind, "device") == 0) {
            DeviceTake(record);
        } else if (strcmp(szKind, "fault") == 0) {
            FaultTake(record);
        } else if (strcmp(szKind, "time") == 0) {
            g_when = static_cast<std::int64_t>(NumberNext(record));
        } else if (strcmp(szKind, "calls") == 0) {
            g_fCallsTold = true;
        } else {
            g_fRealSleep = true;
        }
    }
    return true;
}

// ---- records of what happened ------------------------------------------------------------------

void EventRecord(const char *szKind, const char *szWord, const char *szMore)
{
    char ach[256] = "";
    const int cb = snprintf(ach, sizeof(ach), "%zu:%s%zu:%s%zu:%s", strlen(szKind), szKind,
                            strlen(szWord), szWord, strlen(szMore), szMore);
    WireSend(ach, static_cast<size_t>(cb));
}

// A fault of one process alone tells what its call was about, too.
void FaultRecord(const FAULT &fault, const char *szFunction, const char *szObject)
{
    char szSeen[16] = "";
    snprintf(szSeen, sizeof(szSeen), "%d", fault.nSeen);
    if (strcmp(fault.szProcess, ANY_PROCESS) == 0) {
        EventRecord(WIRE_FAULT, szFunction, szSeen);
        return;
    }
    char szWhere[160] = "";
    snprintf(szWhere, sizeof(szWhere), "%s %s %s", szSeen, g_szProcess, szObject);
    EventRecord(WIRE_FAULT, szFunction, szWhere);
}

void CallTell(const char *szFunction, const char *szObject)
{
    char szLine[192] = "";
    const int cb =
        snprintf(szLine, sizeof(szLine), "%s %s %s\n", g_szProcess, szFunction, szObject);
    const long fd = syscall(SYS_openat, AT_FDCWD, WIRE_CALLS, O_WRONLY | O_APPEND | O_CLOEXEC);
    (void)syscall(SYS_write, fd, szLine, static_cast<size_t>(cb));
    (void)syscall(SYS_close, fd);
}

// What has begun to fail goes on in the processes that are forked later.
bool IsCounted(const FAULT &fault, const char *szFunction)
{
    return (strcmp(fault.szFunction, ANY_CALL) == 0 || strcmp(fault.szFunction, szFunction) == 0) &&
           (strcmp(fault.szProcess, ANY_PROCESS) == 0 ||
            strcmp(fault.szProcess, g_szProcess) == 0 ||
            (fault.fGoOn && fault.nSeen >= fault.nCall));
}

// A program that counts saves its counts when it ends, and no call of that is to fail.
void EndAwait()
{
    static bool fAwaited = false;
    if (__gcov_dump != nullptr && g_fActive && !fAwaited) {
        fAwaited = true;
        (void)atexit(InterposeDeactivate);
    }
}

// True when this call is the one that has to fail; errno is set then.
bool FaultIsDue(const char *szFunction, const char *szObject = NO_OBJECT)
{
    const int errnoAtEntry = errno;
    EndAwait();
    if (g_fActive && g_fCallsTold) {
        CallTell(szFunction, szObject);
    }
    for (size_t i = 0; i < g_nFault; i++) {
        FAULT &fault = g_faults[i];
        if (!g_fActive || !IsCounted(fault, szFunction)) {
            continue;
        }
        fault.nSeen++;
        if (fault.nSeen == fault.nCall || (fault.fGoOn && fault.nSeen > fault.nCall)) {
            FaultRecord(fault, szFunction, szObject);
            errno = fault.error;
            return true;
        }
    }
    errno = errnoAtEntry;
    return false;
}

// ---- names of files, streams and processes -----------------------------------------------------

// Only the file opened last: an attribute is read at once.
int FileName(int fd, const char *szPath)
{
    if (g_fActive && fd >= 0) {
        g_fileName.fd = fd;
        snprintf(g_fileName.szPath, sizeof(g_fileName.szPath), "%s", szPath);
    }
    return fd;
}

const char *NameOf(int fd)
{
    return fd == g_fileName.fd ? g_fileName.szPath : NO_OBJECT;
}

FILE *StreamName(FILE *pStream, const char *szPath)
{
    if (g_fActive && pStream != nullptr) {
        STREAM_NAME &name = g_streamNames[g_nStreamName++ % STREAM_NAMES];
        name.pStream = pStream;
        snprintf(name.szPath, sizeof(name.szPath), "%s", szPath);
    }
    return pStream;
}

// The newest name counts: a stream's address is used again.
const char *NameOf(const FILE *pStream)
{
    for (size_t n = g_nStreamName; n > 0 && n + STREAM_NAMES > g_nStreamName; n--) {
        const STREAM_NAME &name = g_streamNames[(n - 1) % STREAM_NAMES];
        if (name.pStream == pStream) {
            return name.szPath;
        }
    }
    return NO_OBJECT;
}

void ProcessNameExtend()
{
    const size_t cch = strlen(g_szProcess);
    snprintf(g_szProcess + cch, sizeof(g_szProcess) - cch, ".%d", g_nFork);
    g_nFork = 0;
}

// ---- the next in line --------------------------------------------------------------------------

template <typename FUNCTION>
FUNCTION Next(FUNCTION &pReal, const char *szSymbol)
{
    if (pReal == nullptr) {
        pReal = reinterpret_cast<FUNCTION>(dlsym(RTLD_NEXT, szSymbol));
    }
    return pReal;
}

const DEVICE *DeviceFind(int fd)
{
    struct statx opened = {};
    if (!g_fActive || g_nDevice == 0 || statx(fd, "", AT_EMPTY_PATH, STATX_INO, &opened) != 0) {
        return nullptr;
    }
    for (size_t i = 0; i < g_nDevice; i++) {
        struct statx node = {};
        if (statx(AT_FDCWD, g_devices[i].szPath, 0, STATX_INO, &node) == 0 &&
            node.stx_ino == opened.stx_ino && node.stx_dev_major == opened.stx_dev_major &&
            node.stx_dev_minor == opened.stx_dev_minor) {
            return &g_devices[i];
        }
    }
    return nullptr;
}

int Answer(int error, void *pOut, const void *pAnswer, size_t cb)
{
    if (error != 0) {
        errno = error;
        return -1;
    }
    memcpy(pOut, pAnswer, cb);
    return 0;
}

// The size of every node, and for arrays what their driver answers.
int RequestAnswer(const DEVICE &device, unsigned long request, void *pOut)
{
    if (request == BLKGETSIZE64) {
        return Answer(device.errnoSize, pOut, &device.cb, sizeof(device.cb));
    }
    if (device.fArray && request == GET_ARRAY_INFO) {
        return Answer(device.errnoInfo, pOut, device.info, sizeof(device.info));
    }
    if (device.fArray && request == REQUEST_HEALTH) {
        return Answer(device.errnoHealth, pOut, &device.health, sizeof(device.health));
    }
    if (device.fArray && request == REQUEST_SYNC) {
        return Answer(device.errnoSync, pOut, &device.sync, sizeof(device.sync));
    }
    errno = ENOTTY;
    return -1;
}

// A request number is what the kernel takes for one: 32 bits without a sign.
int RequestTake(int fd, unsigned long request, void *pOut, int (*pReal)(int, unsigned long, ...))
{
    if (FaultIsDue("ioctl")) {
        return -1;
    }
    const DEVICE *const pDevice = DeviceFind(fd);
    if (pDevice == nullptr) {
        return pReal(fd, request, pOut);
    }
    return RequestAnswer(*pDevice, static_cast<std::uint32_t>(request), pOut);
}

template <typename STAT>
int NodeDress(int fd, STAT *pStat, int result)
{
    const DEVICE *const pDevice = result == 0 ? DeviceFind(fd) : nullptr;
    if (pDevice != nullptr) {
        pStat->st_mode = S_IFBLK | 0660;
        pStat->st_rdev = makedev(pDevice->deviceMajor, pDevice->deviceMinor);
    }
    return result;
}

// Returns true when the sleep was only told.
bool SleepTell(std::uint64_t seconds, std::uint64_t nanoseconds)
{
    if (!g_fActive) {
        return false;
    }
    char szSeconds[48] = "";
    const int cb = snprintf(szSeconds, sizeof(szSeconds), "%llu.%09llu",
                            static_cast<unsigned long long>(seconds),
                            static_cast<unsigned long long>(nanoseconds));
    char *pch = szSeconds + cb;
    while (pch[-1] == '0') {
        *--pch = '\0';
    }
    if (pch[-1] == '.') {
        pch[-1] = '\0';
    }
    EventRecord(WIRE_SLEEP, szSeconds, "");
    return !g_fRealSleep;
}

// The program itself is what is watched; what it starts must not inherit the watching.
__attribute__((constructor)) void Start()
{
    const char *const szPreload = getenv("LD_PRELOAD");
    if (szPreload != nullptr && strcmp(szPreload, WIRE_INTERPOSE) == 0) {
        (void)unsetenv("LD_PRELOAD");
        InterposeActivate();
    }
}

} // namespace

void InterposeActivate()
{
    g_nDevice = 0;
    g_nFault = 0;
    g_fRealSleep = false;
    g_fCallsTold = false;
    g_nFork = 0; // what the process forked before was no part of the run
    g_fActive = DriverRead();
}

void InterposeDeactivate()
{
    g_fActive = false;
}

// The labels are the names that the C library's callers link to; under them the declarations of
// the headers cannot clash with these.
#define VISIBLE extern "C" __attribute__((visibility("default")))

// szObject is what the call is about, for the record.
#define WRAP_CALL(szName, szObject, symbol, type, failure, parameters, arguments)                  \
    VISIBLE type Wrap_##symbol parameters __asm__(#symbol);                                        \
    VISIBLE type Wrap_##symbol parameters                                                          \
    {                                                                                              \
        static type(*pReal) parameters = nullptr;                                                  \
        if (FaultIsDue(szName, szObject)) {                                                        \
            return failure;                                                                        \
        }                                                                                          \
        return Next(pReal, #symbol) arguments;                                                     \
    }
#define WRAP_AS(szName, symbol, type, failure, parameters, arguments)                              \
    WRAP_CALL(szName, NO_OBJECT, symbol, type, failure, parameters, arguments)
#define WRAP(symbol, type, failure, parameters, arguments)                                         \
    WRAP_AS(#symbol, symbol, type, failure, parameters, arguments)

// The call works, and fails all the same: a descriptor is gone after a failed close, too.
#define WRAP_LATE(szName, symbol, type, failure, parameters, arguments)                            \
    VISIBLE type Wrap_##symbol parameters __asm__(#symbol);                                        \
    VISIBLE type Wrap_##symbol parameters                                                          \
    {                                                                                              \
        static type(*pReal) parameters = nullptr;                                                  \
        const bool fFails = FaultIsDue(szName);                                                    \
        const int error = errno;                                                                   \
        const type result = Next(pReal, #symbol) arguments;                                        \
        if (!fFails) {                                                                             \
            return result;                                                                         \
        }                                                                                          \
        errno = error;                                                                             \
        return failure;                                                                            \
    }

// ---- requests and device numbers ---------------------------------------------------------------

#define WRAP_IOCTL(symbol)                                                                         \
    VISIBLE int Wrap_##symbol(int fd, unsigned long request, void *pOut) __asm__(#symbol);         \
    VISIBLE int Wrap_##symbol(int fd, unsigned long request, void *pOut)                           \
    {                                                                                              \
        static int (*pReal)(int, unsigned long, ...) = nullptr;                                    \
        return RequestTake(fd, request, pOut, Next(pReal, #symbol));                               \
    }

#define WRAP_FSTAT(symbol, STAT)                                                                   \
    VISIBLE int Wrap_##symbol(int fd, STAT *pStat) __asm__(#symbol);                               \
    VISIBLE int Wrap_##symbol(int fd, STAT *pStat)                                                 \
    {                                                                                              \
        static int (*pReal)(int, STAT *) = nullptr;                                                \
        return FaultIsDue("fstat") ? -1 : NodeDress(fd, pStat, Next(pReal, #symbol)(fd, pStat));   \
    }

// ---- sleeps ------------------------------------------------------------------------------------

#define WRAP_NANOSLEEP(symbol, TIMESPEC)                                                           \
    VISIBLE int Wrap_##symbol(const TIMESPEC *pTime, TIMESPEC *pLeft) __asm__(#symbol);            \
    VISIBLE int Wrap_##symbol(const TIMESPEC *pTime, TIMESPEC *pLeft)                              \
    {                                                                                              \
        static int (*pReal)(const TIMESPEC *, TIMESPEC *) = nullptr;                               \
        return SleepTell(static_cast<std::uint64_t>(pTime->tv_sec),                                \
                         static_cast<std::uint64_t>(pTime->tv_nsec))                               \
                   ? 0                                                                             \
                   : Next(pReal, #symbol)(pTime, pLeft);                                           \
    }

#define WRAP_CLOCK_NANOSLEEP(symbol, TIMESPEC)                                                     \
    VISIBLE int Wrap_##symbol(clockid_t clock, int flags, const TIMESPEC *pTime,                   \
                              TIMESPEC *pLeft) __asm__(#symbol);                                   \
    VISIBLE int Wrap_##symbol(clockid_t clock, int flags, const TIMESPEC *pTime, TIMESPEC *pLeft)  \
    {                                                                                              \
        static int (*pReal)(clockid_t, int, const TIMESPEC *, TIMESPEC *) = nullptr;               \
        return SleepTell(static_cast<std::uint64_t>(pTime->tv_sec),                                \
                         static_cast<std::uint64_t>(pTime->tv_nsec))                               \
                   ? 0                                                                             \
                   : Next(pReal, #symbol)(clock, flags, pTime, pLeft);                             \
    }

VISIBLE unsigned int Wrap_sleep(unsigned int seconds) __asm__("sleep");
VISIBLE unsigned int Wrap_sleep(unsigned int seconds)
{
    static unsigned int (*pReal)(unsigned int) = nullptr;
    return SleepTell(seconds, 0) ? 0 : Next(pReal, "sleep")(seconds);
}

VISIBLE int Wrap_usleep(unsigned int microseconds) __asm__("usleep");
VISIBLE int Wrap_usleep(unsigned int microseconds)
{
    static int (*pReal)(unsigned int) = nullptr;
    return SleepTell(microseconds / 1000000, microseconds % 1000000 * 1000ULL)
               ? 0
               : Next(pReal, "usleep")(microseconds);
}

#define WRAP_TIME(symbol, TIME)                                                                    \
    VISIBLE TIME Wrap_##symbol(TIME *pTime) __asm__(#symbol);                                      \
    VISIBLE TIME Wrap_##symbol(TIME *pTime)                                                        \
    {                                                                                              \
        static TIME (*pReal)(TIME *) = nullptr;                                                    \
        if (!g_fActive) {                                                                          \
            return Next(pReal, #symbol)(pTime);                                                    \
        }                                                                                          \
        const auto now = static_cast<TIME>(g_when);                                                \
        if (pTime != nullptr) {                                                                    \
            *pTime = now;                                                                          \
        }                                                                                          \
        return now;                                                                                \
    }

WRAP_TIME(time, time_t)
WRAP_IOCTL(ioctl)
WRAP_FSTAT(fstat, struct stat)
WRAP_FSTAT(fstat64, struct stat64)
WRAP_NANOSLEEP(nanosleep, struct timespec)
WRAP_CLOCK_NANOSLEEP(clock_nanosleep, struct timespec)

// What 32-bit programs with 64-bit times link to.
#if __TIMESIZE == 32
struct TIMESPEC_64 {
    std::int64_t tv_sec;
    std::int64_t tv_nsec;
};
struct STAT_TIME_64 {
    __dev_t st_dev;
    __ino64_t st_ino;
    __mode_t st_mode;
    __nlink_t st_nlink;
    __uid_t st_uid;
    __gid_t st_gid;
    __dev_t st_rdev;
};
WRAP_TIME(__time64, std::int64_t)
WRAP_IOCTL(__ioctl_time64)
WRAP_FSTAT(__fstat64_time64, STAT_TIME_64)
WRAP_NANOSLEEP(__nanosleep64, TIMESPEC_64)
WRAP_CLOCK_NANOSLEEP(__clock_nanosleep_time64, TIMESPEC_64)
#endif

// ---- calls that can be made to fail ------------------------------------------------------------

// With a sanitizer the next malloc in line is the sanitizer's; otherwise the C library's own, which
// is reached without dlsym because dlsym may allocate.
#ifdef SANDBOX_SANITIZED
WRAP(malloc, void *, nullptr, (size_t cb), (cb))
WRAP(calloc, void *, nullptr, (size_t n, size_t cb), (n, cb))
WRAP(realloc, void *, nullptr, (void *p, size_t cb), (p, cb))
#else
extern "C" void *__libc_malloc(size_t cb);
extern "C" void *__libc_calloc(size_t n, size_t cb);
extern "C" void *__libc_realloc(void *p, size_t cb);

#define WRAP_ALLOCATION(symbol, parameters, arguments)                                             \
    VISIBLE void *Wrap_##symbol parameters __asm__(#symbol);                                       \
    VISIBLE void *Wrap_##symbol parameters                                                         \
    {                                                                                              \
        return FaultIsDue(#symbol) ? nullptr : __libc_##symbol arguments;                          \
    }
WRAP_ALLOCATION(malloc, (size_t cb), (cb))
WRAP_ALLOCATION(calloc, (size_t n, size_t cb), (n, cb))
WRAP_ALLOCATION(realloc, (void *p, size_t cb), (p, cb))
#endif

WRAP(strdup, char *, nullptr, (const char *sz), (sz))
WRAP(strndup, char *, nullptr, (const char *sz, size_t cb), (sz, cb))

#define WRAP_OPEN_FILE(symbol, parameters, arguments)                                              \
    VISIBLE int Wrap_##symbol parameters __asm__(#symbol);                                         \
    VISIBLE int Wrap_##symbol parameters                                                           \
    {                                                                                              \
        static int(*pReal) parameters = nullptr;                                                   \
        return FaultIsDue("open", sz) ? -1 : FileName(Next(pReal, #symbol) arguments, sz);         \
    }
WRAP_OPEN_FILE(open, (const char *sz, int flags, mode_t mode), (sz, flags, mode))
WRAP_OPEN_FILE(open64, (const char *sz, int flags, mode_t mode), (sz, flags, mode))
WRAP_OPEN_FILE(__open_2, (const char *sz, int flags), (sz, flags))
WRAP_OPEN_FILE(__open64_2, (const char *sz, int flags), (sz, flags))

#define WRAP_OPEN(szName, symbol)                                                                  \
    VISIBLE FILE *Wrap_##symbol(const char *sz, const char *szMode) __asm__(#symbol);              \
    VISIBLE FILE *Wrap_##symbol(const char *sz, const char *szMode)                                \
    {                                                                                              \
        static FILE *(*pReal)(const char *, const char *) = nullptr;                               \
        return FaultIsDue(szName, sz) ? nullptr                                                    \
                                      : StreamName(Next(pReal, #symbol)(sz, szMode), sz);          \
    }
WRAP_OPEN("fopen", fopen)
WRAP_OPEN("fopen", fopen64)
WRAP_OPEN("setmntent", setmntent)

VISIBLE FILE *Wrap_fdopen(int fd, const char *szMode) __asm__("fdopen");
VISIBLE FILE *Wrap_fdopen(int fd, const char *szMode)
{
    static FILE *(*pReal)(int, const char *) = nullptr;
    return FaultIsDue("fdopen") ? nullptr : StreamName(Next(pReal, "fdopen")(fd, szMode), "pipe");
}

WRAP_LATE("close", close, int, -1, (int fd), (fd))
WRAP_LATE("fclose", fclose, int, EOF, (FILE * p), (p))
WRAP_LATE("endmntent", endmntent, int, 0, (FILE * p), (p))
WRAP(fflush, int, EOF, (FILE * p), (p))
WRAP_CALL("fgets", NameOf(p), fgets, char *, nullptr, (char *sz, int cb, FILE *p), (sz, cb, p))
WRAP_CALL("fgets", NameOf(p), __fgets_chk, char *, nullptr,
          (char *sz, size_t cbBuffer, int cb, FILE *p), (sz, cbBuffer, cb, p))
WRAP_CALL("fgetc", NameOf(p), fgetc, int, EOF, (FILE * p), (p))
WRAP_CALL("getline", NameOf(p), getline, ssize_t, -1, (char **psz, size_t *pcb, FILE *p),
          (psz, pcb, p))
WRAP_CALL("getline", NameOf(p), __getdelim, ssize_t, -1, (char **psz, size_t *pcb, int ch, FILE *p),
          (psz, pcb, ch, p))
WRAP_CALL("read", NameOf(fd), read, ssize_t, -1, (int fd, void *p, size_t cb), (fd, p, cb))
WRAP_CALL("read", NameOf(fd), __read_chk, ssize_t, -1,
          (int fd, void *p, size_t cb, size_t cbBuffer), (fd, p, cb, cbBuffer))
WRAP(write, ssize_t, -1, (int fd, const void *p, size_t cb), (fd, p, cb))
WRAP(pipe2, int, -1, (int *pfd, int flags), (pfd, flags))

VISIBLE pid_t Wrap_fork() __asm__("fork");
VISIBLE pid_t Wrap_fork()
{
    static pid_t (*pReal)() = nullptr;
    if (FaultIsDue("fork")) {
        return -1;
    }
    g_nFork++;
    const pid_t pid = Next(pReal, "fork")();
    if (pid == 0 && g_fActive) {
        ProcessNameExtend();
    }
    return pid;
}

// A child that cannot be waited for because it is not there was reaped by somebody else.
VISIBLE pid_t Wrap_waitpid(pid_t pid, int *pStatus, int options) __asm__("waitpid");
VISIBLE pid_t Wrap_waitpid(pid_t pid, int *pStatus, int options)
{
    static pid_t (*pReal)(pid_t, int *, int) = nullptr;
    if (!FaultIsDue("waitpid")) {
        return Next(pReal, "waitpid")(pid, pStatus, options);
    }
    const int error = errno;
    if (error == ECHILD) {
        (void)Next(pReal, "waitpid")(pid, nullptr, 0);
    }
    errno = error;
    return -1;
}

WRAP_CALL("execv", sz, execv, int, -1, (const char *sz, char *const *argv), (sz, argv))
WRAP(dup2, int, -1, (int fd, int fdNew), (fd, fdNew))
WRAP(fcntl, int, -1, (int fd, int command, long argument), (fd, command, argument))
WRAP_AS("fcntl", fcntl64, int, -1, (int fd, int command, long argument), (fd, command, argument))
WRAP_CALL("access", sz, access, int, -1, (const char *sz, int mode), (sz, mode))
WRAP_CALL("stat", sz, stat, int, -1, (const char *sz, struct stat *p), (sz, p))
WRAP_CALL("stat", sz, stat64, int, -1, (const char *sz, struct stat64 *p), (sz, p))
WRAP_CALL("rmdir", sz, rmdir, int, -1, (const char *sz), (sz))
WRAP(chdir, int, -1, (const char *sz), (sz))
WRAP(setsid, pid_t, -1, (), ())
WRAP_AS("setpriority", setpriority, int, -1, (__priority_which_t which, id_t who, int priority),
        (which, who, priority))
WRAP(sigaction, int, -1, (int number, const struct sigaction *pNew, struct sigaction *pOld),
     (number, pNew, pOld))
WRAP(clearenv, int, -1, (), ())
WRAP(setenv, int, -1, (const char *szName, const char *szValue, int fOverwrite),
     (szName, szValue, fOverwrite))
WRAP(sysconf, long, -1, (int name), (name))
WRAP(system, int, -1, (const char *sz), (sz))
WRAP_CALL("getmntent_r", NameOf(p), getmntent_r, struct mntent *, nullptr,
          (FILE * p, struct mntent *pEntry, char *sz, int cb), (p, pEntry, sz, cb))
WRAP(localtime_r, struct tm *, nullptr, (const time_t *pTime, struct tm *pLocal), (pTime, pLocal))
WRAP(strftime, size_t, 0, (char *sz, size_t cb, const char *szFormat, const struct tm *pTime),
     (sz, cb, szFormat, pTime))

// What is printed: a stream that takes nothing.
WRAP(puts, int, EOF, (const char *sz), (sz))
WRAP_AS("puts", putchar, int, EOF, (int ch), (ch))
WRAP_AS("puts", putc, int, EOF, (int ch, FILE *p), (ch, p))
WRAP_AS("puts", fputs, int, EOF, (const char *sz, FILE *p), (sz, p))

#define WRAP_PRINT(szName, symbol, parameters, pStream)                                            \
    VISIBLE int Wrap_##symbol parameters __asm__(#symbol);                                         \
    VISIBLE int Wrap_##symbol parameters                                                           \
    {                                                                                              \
        if (FaultIsDue(szName)) {                                                                  \
            return -1;                                                                             \
        }                                                                                          \
        va_list arguments;                                                                         \
        va_start(arguments, szFormat);                                                             \
        const int cch = vfprintf(pStream, szFormat, arguments);                                    \
        va_end(arguments);                                                                         \
        return cch;                                                                                \
    }
WRAP_PRINT("printf", printf, (const char *szFormat, ...), stdout)
WRAP_PRINT("printf", __printf_chk, (int, const char *szFormat, ...), stdout)
WRAP_PRINT("fprintf", fprintf, (FILE * p, const char *szFormat, ...), p)
WRAP_PRINT("fprintf", __fprintf_chk, (FILE * p, int, const char *szFormat, ...), p)

// A pattern cannot fail with an errno of its own, so the errno asked for tells which failure.
WRAP_CALL("glob", sz, glob, int, errno == ENOMEM ? GLOB_NOSPACE : GLOB_ABORTED,
          (const char *sz, int flags, int (*pError)(const char *, int), glob_t *p),
          (sz, flags, pError, p))
WRAP_CALL("glob", sz, glob64, int, errno == ENOMEM ? GLOB_NOSPACE : GLOB_ABORTED,
          (const char *sz, int flags, int (*pError)(const char *, int), glob64_t *p),
          (sz, flags, pError, p))
WRAP_CALL("scandir", sz, scandir, int, -1,
          (const char *sz, struct dirent ***p, int (*pFilter)(const struct dirent *),
           int (*pCompare)(const struct dirent **, const struct dirent **)),
          (sz, p, pFilter, pCompare))
WRAP_CALL("scandir", sz, scandir64, int, -1,
          (const char *sz, struct dirent64 ***p, int (*pFilter)(const struct dirent64 *),
           int (*pCompare)(const struct dirent64 **, const struct dirent64 **)),
          (sz, p, pFilter, pCompare))

// What 32-bit programs with 64-bit times link to.
#if __TIMESIZE == 32
WRAP_AS("fcntl", __fcntl_time64, int, -1, (int fd, int command, long argument),
        (fd, command, argument))
WRAP_CALL("stat", sz, __stat64_time64, int, -1, (const char *sz, void *p), (sz, p))
WRAP_AS("localtime_r", __localtime64_r, void *, nullptr, (const void *pTime, void *pLocal),
        (pTime, pLocal))
WRAP_CALL("glob", sz, __glob64_time64, int, errno == ENOMEM ? GLOB_NOSPACE : GLOB_ABORTED,
          (const char *sz, int flags, int (*pError)(const char *, int), void *p),
          (sz, flags, pError, p))
#endif

// Children of the program end by _exit, which drops what a program that counts has counted.
VISIBLE void Wrap__exit(int status) __asm__("_exit");
VISIBLE void Wrap__exit(int status)
{
    if (g_fActive && __gcov_dump != nullptr) {
        g_fActive = false;
        __gcov_dump();
    }
    (void)syscall(SYS_exit_group, status);
    __builtin_unreachable();
}
