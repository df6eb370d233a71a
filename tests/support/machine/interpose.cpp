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
constexpr size_t ANSWERS = 4;

// A request as the driver file names it, and the width of the numbers in its answer. An array
// answers all of them, any other node the first one.
struct REQUEST {
    const char *szName;
    unsigned long number;
    size_t cbNumber;
};

constexpr REQUEST REQUESTS[ANSWERS] = {
    {"size", BLKGETSIZE64, sizeof(std::uint64_t)},
    {"array", GET_ARRAY_INFO, sizeof(int)},
    {"health", _IOR(MD_MAJOR, 0x61, int), sizeof(int)},
    {"sync", _IOR(MD_MAJOR, 0x60, std::uint64_t[3]), sizeof(std::uint64_t)},
};

struct ANSWER {
    unsigned long request;
    int error;
    size_t cb;
    unsigned char ab[sizeof(mdu_array_info_t)];
};

struct DEVICE {
    const char *szPath;
    unsigned int deviceMajor;
    unsigned int deviceMinor;
    ANSWER answers[ANSWERS];
    size_t nAnswer;
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

// The next word of a line; empty at its end.
char *WordNext(char *&pLine)
{
    static char szNone[] = "";
    char *const szWord = strsep(&pLine, " ");
    return szWord == nullptr ? szNone : szWord;
}

std::int64_t NumberNext(char *&pLine)
{
    return static_cast<std::int64_t>(strtoull(WordNext(pLine), nullptr, 10));
}

int IntNext(char *&pLine)
{
    return static_cast<int>(NumberNext(pLine));
}

void DeviceTake(char *pLine)
{
    if (g_nDevice == DEVICES) {
        abort();
    }
    DEVICE &device = g_devices[g_nDevice++];
    device.szPath = WordNext(pLine);
    device.deviceMajor = static_cast<unsigned int>(IntNext(pLine));
    device.deviceMinor = static_cast<unsigned int>(IntNext(pLine));
    device.nAnswer = 0;
}

// What the last device answers to a request: an errno, and the numbers one behind the other.
void AnswerTake(const REQUEST &request, char *pLine)
{
    DEVICE &device = g_devices[g_nDevice - 1];
    ANSWER &answer = device.answers[device.nAnswer++];
    answer.request = request.number;
    answer.error = IntNext(pLine);
    for (answer.cb = 0; pLine != nullptr; answer.cb += request.cbNumber) {
        const std::int64_t number = NumberNext(pLine);
        const int word = static_cast<int>(number);
        const void *const p =
            request.cbNumber == sizeof(word) ? &word : static_cast<const void *>(&number);
        memcpy(answer.ab + answer.cb, p, request.cbNumber);
    }
}

void FaultTake(char *pLine)
{
    if (g_nFault == FAULTS) {
        abort();
    }
    FAULT &fault = g_faults[g_nFault++];
    fault.szFunction = WordNext(pLine);
    fault.nCall = IntNext(pLine);
    fault.error = IntNext(pLine);
    fault.fGoOn = IntNext(pLine) != 0;
    fault.szProcess = WordNext(pLine);
    fault.nSeen = 0;
}

void LineTake(char *pLine)
{
    const char *const szKind = WordNext(pLine);
    for (const REQUEST &request : REQUESTS) {
        if (strcmp(szKind, request.szName) == 0) {
            AnswerTake(request, pLine);
        }
    }
    if (strcmp(szKind, "device") == 0) {
        DeviceTake(pLine);
    } else if (strcmp(szKind, "fault") == 0) {
        FaultTake(pLine);
    } else if (strcmp(szKind, "time") == 0) {
        g_when = NumberNext(pLine);
    }
    g_fCallsTold = g_fCallsTold || strcmp(szKind, "calls") == 0;
    g_fRealSleep = g_fRealSleep || strcmp(szKind, "realsleep") == 0;
}

bool DriverRead()
{
    const long fd = syscall(SYS_openat, AT_FDCWD, WIRE_DRIVER, O_RDONLY | O_CLOEXEC);
    if (fd < 0) {
        return false;
    }
    const long cb = syscall(SYS_read, fd, g_achDriver, sizeof(g_achDriver) - 1);
    (void)syscall(SYS_close, fd);
    g_achDriver[cb < 0 ? 0 : cb] = '\0';
    for (char *pRest = g_achDriver; pRest != nullptr;) {
        LineTake(strsep(&pRest, "\n"));
    }
    return true;
}

// ---- records of what happened ------------------------------------------------------------------

void EventRecord(const char *szKind, const char *szWord, const char *szMore)
{
    static WIRE_RECORD record;
    record.cb = 0;
    for (const char *const sz : {szKind, szWord, szMore}) {
        WireAdd(record, sz);
    }
    WireSend(record);
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
        g_fActive = false; // it may allocate, and that is no call of the program
        (void)atexit(InterposeDeactivate);
        g_fActive = true;
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

template <auto WRAP>
auto Next(const char *szSymbol)
{
    static decltype(WRAP) pReal = nullptr;
    if (pReal == nullptr) {
        pReal = reinterpret_cast<decltype(WRAP)>(dlsym(RTLD_NEXT, szSymbol));
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

int RequestAnswer(const DEVICE &device, unsigned long request, void *pOut)
{
    for (size_t i = 0; i < device.nAnswer; i++) {
        const ANSWER &answer = device.answers[i];
        if (answer.request == request && answer.error == 0) {
            memcpy(pOut, answer.ab, answer.cb);
            return 0;
        }
        if (answer.request == request) {
            errno = answer.error;
            return -1;
        }
    }
    errno = ENOTTY;
    return -1;
}

// A request number is what the kernel takes for one: 32 bits without a sign.
int RequestTake(int fd, unsigned long request, void *pOut, int (*pReal)(int, unsigned long, void *))
{
    const DEVICE *const pDevice = DeviceFind(fd);
    return pDevice == nullptr ? pReal(fd, request, pOut)
                              : RequestAnswer(*pDevice, static_cast<std::uint32_t>(request), pOut);
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
#define VISIBLE __attribute__((visibility("default")))
#define INTERPOSED(symbol, type, parameters)                                                       \
    extern "C" VISIBLE type Wrap_##symbol parameters __asm__(#symbol);                             \
    extern "C" type Wrap_##symbol parameters
#define NEXT(symbol) Next<Wrap_##symbol>(#symbol)

// A call that fails or is done; szObject is what it is about, for the record.
#define WRAP_DONE(szName, szObject, symbol, type, failure, parameters, done)                       \
    INTERPOSED(symbol, type, parameters)                                                           \
    {                                                                                              \
        return FaultIsDue(szName, szObject) ? (failure) : done;                                    \
    }
#define WRAP_CALL(szName, szObject, symbol, type, failure, parameters, arguments)                  \
    WRAP_DONE(szName, szObject, symbol, type, failure, parameters, NEXT(symbol) arguments)
#define WRAP_AS(szName, symbol, type, failure, parameters, arguments)                              \
    WRAP_CALL(szName, NO_OBJECT, symbol, type, failure, parameters, arguments)
#define WRAP(symbol, type, failure, parameters, arguments)                                         \
    WRAP_AS(#symbol, symbol, type, failure, parameters, arguments)

// The call works, and fails all the same: a descriptor is gone after a failed close, too.
#define WRAP_LATE(symbol, type, failure, parameters, arguments)                                    \
    INTERPOSED(symbol, type, parameters)                                                           \
    {                                                                                              \
        const bool fFails = FaultIsDue(#symbol);                                                   \
        const int error = errno;                                                                   \
        const type result = NEXT(symbol) arguments;                                                \
        errno = fFails ? error : errno;                                                            \
        return fFails ? (failure) : result;                                                        \
    }

// ---- requests, device numbers, sleeps ----------------------------------------------------------

#define WRAP_IOCTL(symbol)                                                                         \
    WRAP_DONE("ioctl", NO_OBJECT, symbol, int, -1, (int fd, unsigned long request, void *pOut),    \
              RequestTake(fd, request, pOut, NEXT(symbol)))
#define WRAP_FSTAT(symbol, STAT)                                                                   \
    WRAP_DONE("fstat", NO_OBJECT, symbol, int, -1, (int fd, STAT *pStat),                          \
              NodeDress(fd, pStat, NEXT(symbol)(fd, pStat)))

#define WRAP_SLEEP(symbol, type, parameters, arguments, seconds, nanoseconds)                      \
    INTERPOSED(symbol, type, parameters)                                                           \
    {                                                                                              \
        return SleepTell(static_cast<std::uint64_t>(seconds),                                      \
                         static_cast<std::uint64_t>(nanoseconds))                                  \
                   ? 0                                                                             \
                   : NEXT(symbol) arguments;                                                       \
    }
#define WRAP_NANOSLEEP(symbol, TIMESPEC)                                                           \
    WRAP_SLEEP(symbol, int, (const TIMESPEC *pTime, TIMESPEC *pLeft), (pTime, pLeft),              \
               pTime->tv_sec, pTime->tv_nsec)
#define WRAP_CLOCK_NANOSLEEP(symbol, TIMESPEC)                                                     \
    WRAP_SLEEP(symbol, int, (clockid_t clock, int flags, const TIMESPEC *pTime, TIMESPEC *pLeft),  \
               (clock, flags, pTime, pLeft), pTime->tv_sec, pTime->tv_nsec)
WRAP_SLEEP(sleep, unsigned int, (unsigned int seconds), (seconds), seconds, 0)
WRAP_SLEEP(usleep, int, (unsigned int microseconds), (microseconds), microseconds / 1000000,
           microseconds % 1000000 * 1000ULL)

#define WRAP_TIME(symbol, TIME)                                                                    \
    INTERPOSED(symbol, TIME, (TIME * pTime))                                                       \
    {                                                                                              \
        if (!g_fActive) {                                                                          \
            return NEXT(symbol)(pTime);                                                            \
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
#define NEXT_ALLOCATION(symbol) NEXT(symbol)
#else
extern "C" void *__libc_malloc(size_t cb);
extern "C" void *__libc_calloc(size_t n, size_t cb);
extern "C" void *__libc_realloc(void *p, size_t cb);
#define NEXT_ALLOCATION(symbol) __libc_##symbol
#endif
#define WRAP_ALLOCATION(symbol, parameters, arguments)                                             \
    WRAP_DONE(#symbol, NO_OBJECT, symbol, void *, nullptr, parameters,                             \
              NEXT_ALLOCATION(symbol) arguments)
WRAP_ALLOCATION(malloc, (size_t cb), (cb))
WRAP_ALLOCATION(calloc, (size_t n, size_t cb), (n, cb))
WRAP_ALLOCATION(realloc, (void *p, size_t cb), (p, cb))
WRAP(strdup, char *, nullptr, (const char *sz), (sz))
WRAP(strndup, char *, nullptr, (const char *sz, size_t cb), (sz, cb))

#define WRAP_OPEN_FILE(symbol, parameters, arguments)                                              \
    WRAP_DONE("open", sz, symbol, int, -1, parameters, FileName(NEXT(symbol) arguments, sz))
WRAP_OPEN_FILE(open, (const char *sz, int flags, mode_t mode), (sz, flags, mode))
WRAP_OPEN_FILE(open64, (const char *sz, int flags, mode_t mode), (sz, flags, mode))
WRAP_OPEN_FILE(__open_2, (const char *sz, int flags), (sz, flags))
WRAP_OPEN_FILE(__open64_2, (const char *sz, int flags), (sz, flags))

#define WRAP_OPEN(szName, symbol)                                                                  \
    WRAP_DONE(szName, sz, symbol, FILE *, nullptr, (const char *sz, const char *szMode),           \
              StreamName(NEXT(symbol)(sz, szMode), sz))
WRAP_OPEN("fopen", fopen)
WRAP_OPEN("fopen", fopen64)
WRAP_OPEN("setmntent", setmntent)

WRAP_DONE("fdopen", NO_OBJECT, fdopen, FILE *, nullptr, (int fd, const char *szMode),
          StreamName(NEXT(fdopen)(fd, szMode), "pipe"))

WRAP_LATE(close, int, -1, (int fd), (fd))
WRAP_LATE(fclose, int, EOF, (FILE * p), (p))
WRAP_LATE(endmntent, int, 0, (FILE * p), (p))
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

INTERPOSED(fork, pid_t, ())
{
    if (FaultIsDue("fork")) {
        return -1;
    }
    g_nFork++;
    const pid_t pid = NEXT(fork)();
    if (pid == 0 && g_fActive) {
        ProcessNameExtend();
    }
    return pid;
}

// A child that cannot be waited for because it is not there was reaped by somebody else.
INTERPOSED(waitpid, pid_t, (pid_t pid, int *pStatus, int options))
{
    if (!FaultIsDue("waitpid")) {
        return NEXT(waitpid)(pid, pStatus, options);
    }
    const int error = errno;
    if (error == ECHILD) {
        (void)NEXT(waitpid)(pid, nullptr, 0);
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
    INTERPOSED(symbol, int, parameters)                                                            \
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
INTERPOSED(_exit, void, (int status))
{
    if (g_fActive && __gcov_dump != nullptr) {
        g_fActive = false;
        __gcov_dump();
    }
    (void)syscall(SYS_exit_group, status);
    __builtin_unreachable();
}
