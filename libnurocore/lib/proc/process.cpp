// SPDX-License-Identifier: MIT
#include "nurocore/process.h"

#include "lock_file.h"
#include "nurocore/error.h"
#include "nurocore/handle.h"
#include "nurocore/log.h"

#include <cerrno>
#include <csignal>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <paths.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

// Clears SA_NOCLDWAIT of SIGCHLD during its lifetime, so that a child can be waited for.
struct CHILD_WAIT_SCOPE {
    struct sigaction action = {};
    bool fCleared = false;

    CHILD_WAIT_SCOPE()
    {
        if (sigaction(SIGCHLD, nullptr, &action) != 0 || (action.sa_flags & SA_NOCLDWAIT) == 0) {
            return;
        }
        struct sigaction waitable = action;
        waitable.sa_flags &= ~SA_NOCLDWAIT;
        fCleared = sigaction(SIGCHLD, &waitable, nullptr) == 0;
    }
    CHILD_WAIT_SCOPE(const CHILD_WAIT_SCOPE &) = delete;
    CHILD_WAIT_SCOPE &operator=(const CHILD_WAIT_SCOPE &) = delete;
    ~CHILD_WAIT_SCOPE()
    {
        if (fCleared) {
            (void)sigaction(SIGCHLD, &action, nullptr);
        }
    }
};

pid_t WaitUninterrupted(pid_t pid, int *pStatus)
{
    pid_t waited = 0;
    do {
        waited = waitpid(pid, pStatus, 0);
    } while (waited < 0 && errno == EINTR);
    return waited;
}

void EnvironmentReset()
{
    const char *const szPath = getenv("PATH");
    const HEAP_OWNER<char> szKept(szPath == nullptr ? nullptr : strdup(szPath));
    (void)clearenv();
    if (szKept != nullptr) {
        (void)setenv("PATH", szKept.get(), 1);
    }
}

void DescriptorsClose()
{
    const long nDescriptors = sysconf(_SC_OPEN_MAX);
    for (int fd = STDERR_FILENO + 1; fd < nDescriptors; fd++) {
        (void)close(fd);
    }
}

// Continues in a grandchild; the first child ends here.
void ForkAgain()
{
    const pid_t pid = fork();
    if (pid < 0) {
        NLIBCLog(LOG_ERR, "Failed to fork(). errno=[%d/%m]", errno);
        _exit(CHILD_STATUS_FAILED);
    }
    if (pid > 0) {
        _exit(0);
    }
    (void)usleep(1); // lets the first child end first; nothing relies on it
}

void ChildPrepare(unsigned int flags)
{
    if ((flags & FORK_RESET_PRIORITY) != 0) {
        (void)setpriority(PRIO_PROCESS, 0, 0);
    }
    if ((flags & FORK_RESET_ENVIRONMENT) != 0) {
        EnvironmentReset();
    }
    if ((flags & (FORK_RELEASE_LOCKS | FORK_CLOSE_DESCRIPTORS)) != 0) {
        (void)NLIBCLockFilesRelease();
    }
    if ((flags & FORK_STDIO_TO_NULL) != 0) {
        NLIBCStdioToNull();
    }
    if ((flags & FORK_CLOSE_DESCRIPTORS) != 0) {
        DescriptorsClose();
    }
    if ((flags & FORK_DAEMONIZE) != 0) {
        ForkAgain();
    }
    if ((flags & FORK_NEW_SESSION) != 0) {
        (void)setsid();
    }
    if ((flags & FORK_CHDIR_ROOT) != 0) {
        (void)!chdir("/"); // a child that cannot go there stays where it is
    }
}

int DaemonizedResult(pid_t pid)
{
    int status = 0;
    if (WaitUninterrupted(pid, &status) < 0) {
        return errno == ECHILD ? 1 : -1;
    }
    return WIFEXITED(status) && WEXITSTATUS(status) == 0 ? 1 : -1;
}

int RunResult(pid_t pid)
{
    int status = 0;
    const pid_t waited = pid < 0 ? -1 : WaitUninterrupted(pid, &status);
    if (waited > 0 && WIFEXITED(status)) {
        return WEXITSTATUS(status);
    }
    if (pid > 0 && waited < 0 && errno == ECHILD) {
        return 0;
    }
    NLIBCErrSetHere(ERR_CHILD_FAILED);
    return -1;
}

} // namespace

void NLIBCStdioOccupy()
{
    int fd = open(_PATH_DEVNULL, O_RDWR | O_CLOEXEC);
    while (fd >= 0 && fd <= STDERR_FILENO) {
        (void)fcntl(fd, F_SETFD, 0); // the tools inherit it
        fd = open(_PATH_DEVNULL, O_RDWR | O_CLOEXEC);
    }
    // The descriptor above the standard streams stays open: no tool inherits it, and closing it
    // would cost every run a system call.
}

void NLIBCStdioToNull()
{
    const int fd = open(_PATH_DEVNULL, O_RDWR);
    if (fd < 0) {
        return;
    }
    (void)dup2(fd, STDIN_FILENO);
    (void)dup2(fd, STDOUT_FILENO);
    (void)dup2(fd, STDERR_FILENO);
    if (fd > STDERR_FILENO) {
        (void)close(fd);
    }
}

char **NLIBCArgvAlloc(const char *szPath, va_list arguments)
{
    va_list counted;
    va_copy(counted, arguments);
    size_t nArgument = 0;
    // The analyzer does not see that va_copy initialises it.
    // NOLINTNEXTLINE(clang-analyzer-valist.Uninitialized)
    while (va_arg(counted, char *) != nullptr) {
        nArgument++;
    }
    va_end(counted);

    char **const argv = static_cast<char **>(calloc(nArgument + 2, sizeof(char *)));
    if (argv == nullptr) {
        return nullptr;
    }
    argv[0] = const_cast<char *>(szPath); // execv's type; it does not write to it
    for (size_t i = 1; i <= nArgument; i++) {
        argv[i] = va_arg(arguments, char *);
    }
    return argv;
}

int NLIBCFork(unsigned int flags)
{
    (void)fflush(nullptr);
    const pid_t pid = fork();
    if (pid < 0) {
        NLIBCErrSetHere(ERR_FORK_FAILED);
        return -1;
    }
    if (pid == 0) {
        ChildPrepare(flags);
        return 0;
    }
    return (flags & FORK_DAEMONIZE) != 0 ? DaemonizedResult(pid) : pid;
}

int NLIBCExecl(const char *szPath, ...)
{
    if (szPath == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    const CHILD_WAIT_SCOPE waitable;
    const pid_t pid = NLIBCFork(FORK_RUN_AND_WAIT);
    if (pid == 0) {
        va_list arguments;
        va_start(arguments, szPath);
        char **const argv = NLIBCArgvAlloc(szPath, arguments);
        va_end(arguments);
        if (argv != nullptr) {
            (void)execv(szPath, argv);
        }
        _exit(CHILD_STATUS_FAILED);
    }
    return RunResult(pid);
}

int NLIBCForkCloseIo()
{
    const pid_t pid = fork();
    if (pid < 0) {
        NLIBCLog(LOG_ERR, "fork error, errno=%m");
        return -1;
    }
    if (pid == 0) {
        NLIBCStdioToNull();
    }
    return pid;
}
