// SPDX-License-Identifier: MIT
#pragma once

// Children and signals of a test. A test that changes its process for good does so in a child,
// which tells its parent what it saw as text.

#include "nurocore/process.h"

#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <string>
#include <sys/resource.h>
#include <sys/time.h>
#include <sys/wait.h>
#include <unistd.h>

// Present in builds that count coverage: a child that ends without it leaves no counts.
extern "C" void __gcov_dump() __attribute__((weak));

[[noreturn]] inline void ChildEnd(int status)
{
    if (__gcov_dump != nullptr) {
        __gcov_dump();
    }
    _exit(status);
}

// A pipe from children to the test; it is read to its end.
struct REPORT {
    int fd[2] = {-1, -1};

    REPORT()
    {
        (void)!pipe2(fd, O_CLOEXEC);
    }
    void Write(const std::string &text) const
    {
        (void)!write(fd[1], text.data(), text.size());
    }
    std::string Read()
    {
        (void)close(fd[1]);
        std::string text;
        char szPart[4096];
        for (;;) {
            const ssize_t cb = read(fd[0], szPart, sizeof(szPart));
            if (cb > 0) {
                text.append(szPart, static_cast<size_t>(cb));
            } else if (cb == 0 || errno != EINTR) {
                break;
            }
        }
        (void)close(fd[0]);
        return text;
    }
};

inline int WaitFor(pid_t pid)
{
    int status = -1;
    while (waitpid(pid, &status, 0) < 0 && errno == EINTR) {
    }
    return status;
}

// The text that fn returns in a child of its own.
template <typename F>
std::string InChild(F fn)
{
    (void)fflush(nullptr);
    REPORT report;
    const pid_t pid = fork();
    if (pid == 0) {
        report.Write(fn());
        ChildEnd(0);
    }
    std::string text = report.Read();
    (void)WaitFor(pid);
    return text;
}

// The text that fn returns in a child made with NLIBCFork(flags).
template <typename F>
std::string InForkedChild(unsigned int flags, F fn)
{
    REPORT report;
    const int pid = NLIBCFork(flags);
    if (pid == 0) {
        report.Write(fn());
        ChildEnd(0);
    }
    std::string text = report.Read();
    if ((flags & FORK_DAEMONIZE) == 0) {
        (void)WaitFor(pid);
    }
    return text;
}

// What a descriptor leads to; empty when it is closed.
inline std::string DescriptorTarget(int fd)
{
    std::error_code ignored;
    return std::filesystem::read_symlink("/proc/self/fd/" + std::to_string(fd), ignored).string();
}

// How many descriptors are open. Far above are those that a checker of memory keeps for itself.
inline int DescriptorCount()
{
    constexpr int CHECKERS_START = 1000;
    int n = 0;
    for (const auto &entry : std::filesystem::directory_iterator("/proc/self/fd")) {
        n += std::stoi(entry.path().filename()) < CHECKERS_START ? 1 : 0;
    }
    return n;
}

// No child of this process can fork after this. Root is not bound by the limit, so it goes; call
// it in a child only.
inline void ForkForbid()
{
    if (geteuid() == 0) {
        (void)!setresuid(65534, 65534, 65534);
    }
    constexpr rlimit none = {0, 0};
    (void)setrlimit(RLIMIT_NPROC, &none);
}

// A signal's disposition for the length of a scope.
struct SIGNAL_SCOPE {
    int signo;
    struct sigaction before = {};

    SIGNAL_SCOPE(int signoIn, void (*pHandler)(int), int flags = 0) : signo(signoIn)
    {
        struct sigaction action = {};
        action.sa_handler = pHandler;
        action.sa_flags = flags;
        (void)sigaction(signo, &action, &before);
    }
    SIGNAL_SCOPE(const SIGNAL_SCOPE &) = delete;
    SIGNAL_SCOPE &operator=(const SIGNAL_SCOPE &) = delete;
    ~SIGNAL_SCOPE()
    {
        (void)sigaction(signo, &before, nullptr);
    }
};

// Interrupts this process every few milliseconds; calls that wait end with EINTR. Afterwards the
// signal is ignored, so that one that comes late does no harm.
struct INTERRUPTION_SCOPE {
    explicit INTERRUPTION_SCOPE(void (*pHandler)(int))
    {
        struct sigaction action = {};
        action.sa_handler = pHandler;
        (void)sigaction(SIGALRM, &action, nullptr);
        constexpr itimerval often = {{0, 5000}, {0, 5000}};
        (void)setitimer(ITIMER_REAL, &often, nullptr);
    }
    INTERRUPTION_SCOPE(const INTERRUPTION_SCOPE &) = delete;
    INTERRUPTION_SCOPE &operator=(const INTERRUPTION_SCOPE &) = delete;
    ~INTERRUPTION_SCOPE()
    {
        constexpr itimerval never = {{0, 0}, {0, 0}};
        (void)setitimer(ITIMER_REAL, &never, nullptr);
        (void)signal(SIGALRM, SIG_IGN);
    }
};
