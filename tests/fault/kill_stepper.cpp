// SPDX-License-Identifier: MIT
//
// Runs the tool and kills it at one of its system calls:
//
//     stepper PROCESS N alone|all -0 NAME PROGRAM ARGUMENT...
//
// PROCESS is "0" for the tool, "0.2" for the second process that it forks. N counts the entries
// into the kernel since the program was started or the process forked; nothing is killed at 0.
// "alone" kills that process and waits for what it leaves behind, "all" ends everything at once.
// How often each process entered the kernel is left in /steps.

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <sys/prctl.h>
#include <sys/ptrace.h>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

constexpr int PROCESSES = 128;
constexpr int FIRST_PROGRAM_ARGUMENT = 5; // the tool's own name
constexpr int STATUS_BROKEN = 126;

struct PROCESS {
    pid_t pid;
    char szName[40];
    int nFork;
    int nEntry;
    bool fInKernel;
    bool fSteps; // the tool itself, and not a program that it has started
};

PROCESS g_processes[PROCESSES];
int g_nProcess = 0;

PROCESS *ProcessFind(pid_t pid)
{
    for (int i = 0; i < g_nProcess; i++) {
        if (g_processes[i].pid == pid) {
            return &g_processes[i];
        }
    }
    return nullptr;
}

PROCESS &ProcessAdd(pid_t pid, const char *szParent, int nFork)
{
    if (g_nProcess == PROCESSES) {
        _exit(STATUS_BROKEN);
    }
    PROCESS &process = g_processes[g_nProcess++];
    process = {};
    process.pid = pid;
    if (szParent == nullptr) {
        snprintf(process.szName, sizeof(process.szName), "0");
    } else {
        snprintf(process.szName, sizeof(process.szName), "%.24s.%d", szParent, nFork);
    }
    return process;
}

struct TARGET {
    const char *szProcess;
    int nEntry;
    bool fAll;
};

void StepsTell()
{
    const int fd = open("/steps", O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
    for (int i = 0; i < g_nProcess; i++) {
        dprintf(fd, "%s %d\n", g_processes[i].szName, g_processes[i].nEntry);
    }
    close(fd);
}

void EntryCount(PROCESS &process, const TARGET &target)
{
    process.fInKernel = !process.fInKernel;
    if (!process.fInKernel) {
        return;
    }
    process.nEntry++;
    if (process.nEntry == target.nEntry && strcmp(process.szName, target.szProcess) == 0) {
        (void)kill(process.pid, SIGKILL);
        if (target.fAll) {
            StepsTell();
            _exit(128 + SIGKILL);
        }
    }
}

// A new process may stop before its parent tells of it.
void ForkTake(PROCESS &parent)
{
    unsigned long pid = 0;
    (void)ptrace(PTRACE_GETEVENTMSG, parent.pid, nullptr, &pid);
    PROCESS &child = ProcessAdd(static_cast<pid_t>(pid), parent.szName, ++parent.nFork);
    child.fSteps = true;
}

// What the tool starts is not followed.
bool ExecTake(PROCESS &process)
{
    if (process.fSteps) {
        process.fSteps = false;
        (void)ptrace(PTRACE_DETACH, process.pid, nullptr, nullptr);
        return false;
    }
    process.fSteps = strcmp(process.szName, "0") == 0;
    process.nEntry = 0;
    process.fInKernel = true; // it is leaving execve
    return true;
}

// Returns the signal to go on with, -1 when the process is not ours any more.
int StopTake(PROCESS &process, int status, const TARGET &target)
{
    const int signal = WSTOPSIG(status);
    const int event = status >> 16;
    if (signal == (SIGTRAP | 0x80)) {
        EntryCount(process, target);
        return 0;
    }
    if (event == PTRACE_EVENT_FORK || event == PTRACE_EVENT_VFORK || event == PTRACE_EVENT_CLONE) {
        ForkTake(process);
        return 0;
    }
    if (event == PTRACE_EVENT_EXEC) {
        return ExecTake(process) ? 0 : -1;
    }
    return signal == SIGSTOP || signal == SIGTRAP ? 0 : signal;
}

// Until nothing is left, so that what the killed process leaves behind comes to its own end.
int Follow(pid_t tool, const TARGET &target)
{
    int result = STATUS_BROKEN;
    int status = 0;
    for (pid_t pid = 0; (pid = waitpid(-1, &status, __WALL)) > 0 || errno == EINTR;) {
        PROCESS *const pProcess = ProcessFind(pid);
        if (!WIFSTOPPED(status)) {
            result = pid != tool         ? result
                     : WIFEXITED(status) ? WEXITSTATUS(status)
                                         : 128 + WTERMSIG(status);
            continue;
        }
        if (pProcess == nullptr) {
            (void)usleep(100); // until its parent has told of it
            (void)ptrace(PTRACE_SYSCALL, pid, nullptr, nullptr);
            continue;
        }
        const int signal = StopTake(*pProcess, status, target);
        if (signal >= 0) {
            (void)ptrace(PTRACE_SYSCALL, pid, nullptr, signal);
        }
    }
    return result;
}

} // namespace

int main(int argc, char *argv[])
{
    if (argc <= FIRST_PROGRAM_ARGUMENT + 1) {
        return STATUS_BROKEN;
    }
    const TARGET target = {argv[1], atoi(argv[2]), strcmp(argv[3], "all") == 0};
    (void)prctl(PR_SET_CHILD_SUBREAPER, 1);
    const pid_t pid = fork();
    if (pid == 0) {
        (void)ptrace(PTRACE_TRACEME, 0, nullptr, nullptr);
        (void)raise(SIGSTOP);
        (void)execv(argv[FIRST_PROGRAM_ARGUMENT + 1], argv + FIRST_PROGRAM_ARGUMENT + 1);
        _exit(STATUS_BROKEN);
    }
    int status = 0;
    (void)waitpid(pid, &status, 0);
    (void)ptrace(PTRACE_SETOPTIONS, pid, nullptr,
                 PTRACE_O_TRACESYSGOOD | PTRACE_O_TRACEFORK | PTRACE_O_TRACEVFORK |
                     PTRACE_O_TRACECLONE | PTRACE_O_TRACEEXEC | PTRACE_O_EXITKILL);
    (void)ProcessAdd(pid, nullptr, 0);
    (void)ptrace(PTRACE_SYSCALL, pid, nullptr, nullptr);
    const int result = Follow(pid, target);
    StepsTell();
    return result;
}
