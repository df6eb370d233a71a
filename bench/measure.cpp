// SPDX-License-Identifier: MIT
//
//   measure calls STATUS COMMAND [ARGUMENT]...     prints "CALLS CHILDREN" of one run
//   measure runs N STATUS COMMAND [ARGUMENT]...    prints "MINOR_FAULTS PEAK_KIB MICROSECONDS",
//                                                  the medians of N runs
//
// The command's output goes where measure's error output goes, and its exit status must be STATUS.
//
// Linked statically: a program that starts another one lends it its own peak memory.
#include <algorithm>
#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <sys/ptrace.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

constexpr int EXIT_BROKEN = 125; // not a status of the command
constexpr int RUNS_MAX = 1000;
constexpr long NANOSECONDS = 1000000000;

struct COUNTS {
    long nCalls;
    long nChildren;
    long nFaultsBefore; // minor faults of the launching child
    bool fStarted;      // the command has taken the child's place
};

[[noreturn]] void Die(const char *szWhat)
{
    (void)fprintf(stderr, "measure: %s: %s\n", szWhat, strerror(errno));
    exit(EXIT_BROKEN);
}

pid_t Launch(char **argv)
{
    const pid_t pid = fork();
    if (pid < 0) {
        Die("fork");
    }
    if (pid > 0) {
        return pid;
    }
    if (dup2(STDERR_FILENO, STDOUT_FILENO) < 0 || ptrace(PTRACE_TRACEME, 0, 0, 0) != 0) {
        Die("the launch");
    }
    (void)raise(SIGSTOP);
    (void)execv(argv[0], argv);
    Die(argv[0]);
}

// The tenth word of the process's line; the second is its name in parentheses.
long MinorFaults(pid_t pid)
{
    char szPath[64];
    char szLine[512] = {};
    (void)snprintf(szPath, sizeof(szPath), "/proc/%d/stat", pid);
    FILE *const pFile = fopen(szPath, "re");
    if (pFile == nullptr || fgets(szLine, sizeof(szLine), pFile) == nullptr) {
        Die(szPath);
    }
    (void)fclose(pFile);
    const char *const pchName = strrchr(szLine, ')');
    long nFaults = 0;
    if (pchName == nullptr || sscanf(pchName, ") %*c %*d %*d %*d %*d %*d %*u %ld", &nFaults) != 1) {
        Die(szPath);
    }
    return nFaults;
}

// What a stopped process is told when it goes on: the signal that it was stopped by, if it was one.
int StopHandle(pid_t pid, int status, COUNTS &counts)
{
    constexpr int CALL_STOP = SIGTRAP | 0x80;
    const int event = status >> 16;
    if (WSTOPSIG(status) == CALL_STOP) {
        __ptrace_syscall_info info = {};
        (void)ptrace(PTRACE_GET_SYSCALL_INFO, pid, sizeof(info), &info);
        counts.nCalls += counts.fStarted && info.op == PTRACE_SYSCALL_INFO_ENTRY ? 1 : 0;
        return 0;
    }
    switch (event) {
    case PTRACE_EVENT_EXEC:
        if (!counts.fStarted) {
            counts.nCalls = 1; // the execve that started the command
            counts.nFaultsBefore = MinorFaults(pid);
            counts.fStarted = true;
        }
        return 0;
    case PTRACE_EVENT_FORK:
    case PTRACE_EVENT_VFORK:
    case PTRACE_EVENT_CLONE:
        counts.nChildren++;
        return 0;
    default:
        break;
    }
    const int signal = WSTOPSIG(status);
    return signal == SIGSTOP || signal == SIGTRAP ? 0 : signal;
}

// Runs STATUS COMMAND... to its end. fCalls: it stops at every system call, and its children do.
void Run(char **argv, bool fCalls, COUNTS &counts, rusage &usage)
{
    const int expected = atoi(argv[0]);
    argv++;
    const auto how = fCalls ? PTRACE_SYSCALL : PTRACE_CONT;
    const pid_t pidFirst = Launch(argv);
    int status = 0;
    if (waitpid(pidFirst, &status, 0) != pidFirst || !WIFSTOPPED(status)) {
        Die("the launch");
    }
    (void)ptrace(PTRACE_SETOPTIONS, pidFirst, 0,
                 PTRACE_O_TRACEEXEC | PTRACE_O_TRACEFORK | PTRACE_O_TRACEVFORK |
                     PTRACE_O_TRACECLONE | PTRACE_O_TRACESYSGOOD | PTRACE_O_EXITKILL);
    (void)ptrace(how, pidFirst, 0, 0);
    for (;;) {
        const pid_t pid = wait4(-1, &status, __WALL, &usage);
        if (pid < 0) {
            Die("wait");
        }
        if (WIFSTOPPED(status)) {
            const long signal = StopHandle(pid, status, counts);
            (void)ptrace(how, pid, 0, signal);
        } else if (pid == pidFirst) {
            break;
        }
    }
    if (!WIFEXITED(status) || WEXITSTATUS(status) != expected) {
        (void)fprintf(stderr, "measure: %s ended with 0x%x\n", argv[0], status);
        exit(EXIT_BROKEN);
    }
}

long MicrosecondsSince(const timespec &start)
{
    timespec now = {};
    (void)clock_gettime(CLOCK_MONOTONIC, &now);
    return ((now.tv_sec - start.tv_sec) * NANOSECONDS + now.tv_nsec - start.tv_nsec) / 1000;
}

long Median(long *pValues, int nValue)
{
    std::sort(pValues, pValues + nValue);
    return pValues[nValue / 2];
}

void RunsMeasure(int nRun, char **argv)
{
    static long faults[RUNS_MAX];
    static long kib[RUNS_MAX];
    static long microseconds[RUNS_MAX];
    if (nRun < 1 || nRun > RUNS_MAX) {
        errno = EINVAL;
        Die("number of runs");
    }
    for (int i = 0; i < nRun; i++) {
        COUNTS counts = {};
        rusage usage = {};
        timespec start = {};
        (void)clock_gettime(CLOCK_MONOTONIC, &start);
        Run(argv, false, counts, usage);
        microseconds[i] = MicrosecondsSince(start);
        faults[i] = usage.ru_minflt - counts.nFaultsBefore;
        kib[i] = usage.ru_maxrss;
    }
    (void)printf("%ld %ld %ld\n", Median(faults, nRun), Median(kib, nRun),
                 Median(microseconds, nRun));
}

} // namespace

int main(int argc, char **argv)
{
    COUNTS counts = {};
    rusage usage = {};
    const char *const szWhat = argc > 3 ? argv[1] : "";
    if (strcmp(szWhat, "calls") == 0) {
        Run(argv + 2, true, counts, usage);
        (void)printf("%ld %ld\n", counts.nCalls, counts.nChildren);
    } else if (strcmp(szWhat, "runs") == 0 && argc > 4) {
        RunsMeasure(atoi(argv[2]), argv + 3);
    } else {
        (void)fputs("usage: measure calls|runs N STATUS COMMAND [ARGUMENT]...\n", stderr);
        return EXIT_BROKEN;
    }
    return 0;
}
