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
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/sysmacros.h>
#include <unistd.h>

#include <linux/raid/md_u.h>

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
    int nSeen;
};

char g_achDriver[DRIVER_SIZE];
DEVICE g_devices[DEVICES];
size_t g_nDevice = 0;
FAULT g_faults[FAULTS];
size_t g_nFault = 0;
bool g_fActive = false;
bool g_fRealSleep = false;

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
        } else {
            g_fRealSleep = true;
        }
    }
    return true;
}

// ---- records of the transcript -----------------------------------------------------------------

void EventRecord(const char *szKind, const char *szWord, const char *szMore)
{
    char ach[256] = "";
    const int cb = snprintf(ach, sizeof(ach), "%zu:%s%zu:%s%zu:%s", strlen(szKind), szKind,
                            strlen(szWord), szWord, strlen(szMore), szMore);
    char achRecord[320] = "";
    const int cbRecord = snprintf(achRecord, sizeof(achRecord), "%d:%s", cb, ach);
    const long fd = syscall(SYS_openat, AT_FDCWD, WIRE_TRANSCRIPT, O_WRONLY | O_APPEND | O_CLOEXEC);
    if (fd >= 0) {
        (void)syscall(SYS_write, fd, achRecord, static_cast<size_t>(cbRecord));
        (void)syscall(SYS_close, fd);
    }
}

// True when this call is the one that has to fail; errno is set then.
bool FaultIsDue(const char *szFunction)
{
    for (size_t i = 0; i < g_nFault; i++) {
        FAULT &fault = g_faults[i];
        if (!g_fActive || strcmp(fault.szFunction, szFunction) != 0) {
            continue;
        }
        fault.nSeen++;
        if (fault.nSeen == fault.nCall || (fault.fGoOn && fault.nSeen > fault.nCall)) {
            char szSeen[16] = "";
            snprintf(szSeen, sizeof(szSeen), "%d", fault.nSeen);
            EventRecord(WIRE_FAULT, szFunction, szSeen);
            errno = fault.error;
            return true;
        }
    }
    return false;
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
    g_fActive = DriverRead();
}

void InterposeDeactivate()
{
    g_fActive = false;
}

// The labels are the names that the C library's callers link to; under them the declarations of
// the headers cannot clash with these.
#define VISIBLE extern "C" __attribute__((visibility("default")))

#define WRAP_AS(szName, symbol, type, failure, parameters, arguments)                              \
    VISIBLE type Wrap_##symbol parameters __asm__(#symbol);                                        \
    VISIBLE type Wrap_##symbol parameters                                                          \
    {                                                                                              \
        static type(*pReal) parameters = nullptr;                                                  \
        if (FaultIsDue(szName)) {                                                                  \
            return failure;                                                                        \
        }                                                                                          \
        return Next(pReal, #symbol) arguments;                                                     \
    }
#define WRAP(symbol, type, failure, parameters, arguments)                                         \
    WRAP_AS(#symbol, symbol, type, failure, parameters, arguments)

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

WRAP(open, int, -1, (const char *sz, int flags, mode_t mode), (sz, flags, mode))
WRAP_AS("open", open64, int, -1, (const char *sz, int flags, mode_t mode), (sz, flags, mode))
WRAP_AS("open", __open_2, int, -1, (const char *sz, int flags), (sz, flags))
WRAP_AS("open", __open64_2, int, -1, (const char *sz, int flags), (sz, flags))
WRAP(fopen, FILE *, nullptr, (const char *sz, const char *szMode), (sz, szMode))
WRAP_AS("fopen", fopen64, FILE *, nullptr, (const char *sz, const char *szMode), (sz, szMode))
WRAP(fdopen, FILE *, nullptr, (int fd, const char *szMode), (fd, szMode))
WRAP(fclose, int, EOF, (FILE * p), (p))
WRAP(fflush, int, EOF, (FILE * p), (p))
WRAP(fgets, char *, nullptr, (char *sz, int cb, FILE *p), (sz, cb, p))
WRAP_AS("fgets", __fgets_chk, char *, nullptr, (char *sz, size_t cbBuffer, int cb, FILE *p),
        (sz, cbBuffer, cb, p))
WRAP(fgetc, int, EOF, (FILE * p), (p))
WRAP(getline, ssize_t, -1, (char **psz, size_t *pcb, FILE *p), (psz, pcb, p))
WRAP_AS("getline", __getdelim, ssize_t, -1, (char **psz, size_t *pcb, int ch, FILE *p),
        (psz, pcb, ch, p))
WRAP(read, ssize_t, -1, (int fd, void *p, size_t cb), (fd, p, cb))
WRAP_AS("read", __read_chk, ssize_t, -1, (int fd, void *p, size_t cb, size_t cbBuffer),
        (fd, p, cb, cbBuffer))
WRAP(write, ssize_t, -1, (int fd, const void *p, size_t cb), (fd, p, cb))
WRAP(pipe2, int, -1, (int *pfd, int flags), (pfd, flags))
WRAP(fork, pid_t, -1, (), ())
WRAP(execv, int, -1, (const char *sz, char *const *argv), (sz, argv))
WRAP(waitpid, pid_t, -1, (pid_t pid, int *pStatus, int options), (pid, pStatus, options))
WRAP(dup2, int, -1, (int fd, int fdNew), (fd, fdNew))
WRAP(fcntl, int, -1, (int fd, int command, long argument), (fd, command, argument))
WRAP_AS("fcntl", fcntl64, int, -1, (int fd, int command, long argument), (fd, command, argument))
WRAP(access, int, -1, (const char *sz, int mode), (sz, mode))
WRAP(stat, int, -1, (const char *sz, struct stat *p), (sz, p))
WRAP_AS("stat", stat64, int, -1, (const char *sz, struct stat64 *p), (sz, p))
WRAP(rmdir, int, -1, (const char *sz), (sz))
WRAP(chdir, int, -1, (const char *sz), (sz))
WRAP(setsid, pid_t, -1, (), ())
WRAP(system, int, -1, (const char *sz), (sz))
WRAP(setmntent, FILE *, nullptr, (const char *sz, const char *szMode), (sz, szMode))
WRAP(getmntent_r, struct mntent *, nullptr, (FILE * p, struct mntent *pEntry, char *sz, int cb),
     (p, pEntry, sz, cb))
// A pattern cannot fail with an errno of its own, so the errno asked for tells which failure.
WRAP(glob, int, errno == ENOMEM ? GLOB_NOSPACE : GLOB_ABORTED,
     (const char *sz, int flags, int (*pError)(const char *, int), glob_t *p),
     (sz, flags, pError, p))
WRAP_AS("glob", glob64, int, errno == ENOMEM ? GLOB_NOSPACE : GLOB_ABORTED,
        (const char *sz, int flags, int (*pError)(const char *, int), glob64_t *p),
        (sz, flags, pError, p))
WRAP(scandir, int, -1,
     (const char *sz, struct dirent ***p, int (*pFilter)(const struct dirent *),
      int (*pCompare)(const struct dirent **, const struct dirent **)),
     (sz, p, pFilter, pCompare))
WRAP_AS("scandir", scandir64, int, -1,
        (const char *sz, struct dirent64 ***p, int (*pFilter)(const struct dirent64 *),
         int (*pCompare)(const struct dirent64 **, const struct dirent64 **)),
        (sz, p, pFilter, pCompare))

// Children of the program end by _exit, which drops what a coverage build has counted.
#ifdef SANDBOX_COVERAGE
VISIBLE void Wrap__exit(int status) __asm__("_exit");
VISIBLE void Wrap__exit(int status)
{
    static void (*pDump)() = nullptr;
    if (Next(pDump, "__gcov_dump") == nullptr) {
        pDump = reinterpret_cast<void (*)()>(dlsym(RTLD_DEFAULT, "__gcov_dump"));
    }
    if (g_fActive && pDump != nullptr) {
        pDump();
    }
    (void)syscall(SYS_exit_group, status);
    __builtin_unreachable();
}
#endif
