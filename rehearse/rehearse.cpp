// SPDX-License-Identifier: MIT
//
//   arrayctl-rehearse [--tool PATH] [--commands | --json] COMMAND [ARGUMENT...]
//
// Shows what the tool would do to the disks of this machine. The tool changes disks only by running
// programs, so the tool itself is run, with something in the place of these programs that passes
// questions on and writes everything else down.
//
// This process watches; the rehearsal is its child, the first process of a process namespace in a
// mount namespace of its own. When either ends, however it ends, the kernel ends all that ran
// there, and the namespace takes along what was written in it.
#include "host.h"
#include "options.h"
#include "owner.h"
#include "places.h"
#include "print.h"
#include "recorder.h"
#include "run.h"
#include "stage.h"
#include "text.h"

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <fcntl.h>
#include <poll.h>
#include <sched.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

// The tool's pauses are real, and are the only thing in a rehearsal that takes its time.
struct PAUSE_ROW {
    const char *szCommand;
    int nSeconds;
};

constexpr PAUSE_ROW PAUSES[] = {{"initsys", 6}, {"initsys-dd", 6}};

void PausesTell(const OPTIONS &options)
{
    for (const PAUSE_ROW &row : PAUSES) {
        if (options.words[0] == row.szCommand) {
            (void)Complain("%s pauses for %d seconds, in a rehearsal as well", row.szCommand,
                           row.nSeconds);
        }
    }
}

WORDS ToolArguments(const OPTIONS &options)
{
    WORDS argv = {options.szTool};
    argv.insert(argv.end(), options.words.begin(), options.words.end());
    return argv;
}

// All of a rehearsal, in the namespaces that this process is the first of. Returns the exit status.
int Rehearse(const OPTIONS &options, const HOST &host)
{
    const DESCRIPTOR journal(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    const DESCRIPTOR syslog(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    if (journal.fd < 0 || syslog.fd < 0) {
        (void)ComplainErrno("cannot make a socket");
        return STATUS_NOT_REHEARSED;
    }
    if (!StageSetUp(options.szToolPath.c_str(), journal.fd, syslog.fd)) {
        return STATUS_NOT_REHEARSED;
    }
    if (listen(journal.fd, SOMAXCONN) != 0) {
        (void)ComplainErrno("cannot listen to the recorder");
        return STATUS_NOT_REHEARSED;
    }
    if (StageClose() < 0) {
        return STATUS_NOT_REHEARSED;
    }
    PausesTell(options);
    RUN run;
    if (!RunTool(ToolArguments(options), journal.fd, syslog.fd, &run)) {
        return STATUS_NOT_REHEARSED;
    }
    return RehearsalPrint(options, host, run);
}

// The watcher alone can write to the pipe, and never does: it hangs up when it ends.
bool WatcherLives(int fdWatcher)
{
    struct pollfd polled = {.fd = fdWatcher, .events = 0, .revents = 0};
    return poll(&polled, 1, 0) == 0;
}

// A watcher that was killed before the child asked to be killed with it has hung up by then, so the
// child never outlives it.
int ChildRun(const OPTIONS &options, const HOST &host, int fdWatcher)
{
    if (prctl(PR_SET_PDEATHSIG, SIGKILL) != 0) {
        (void)ComplainErrno("cannot end with its watcher");
        return STATUS_NOT_REHEARSED;
    }
    if (!WatcherLives(fdWatcher)) {
        return STATUS_NOT_REHEARSED;
    }
    const int status = Rehearse(options, host);
    // The last of it may find room where what went before it did not.
    if (fflush(stdout) != 0 || ferror(stdout) != 0) {
        (void)Complain("cannot print the rehearsal: its output cannot be written");
        return STATUS_NOT_REHEARSED;
    }
    return status;
}

// Not through fork: the child is to be the first process of its namespaces.
pid_t NamespacesFork()
{
    return static_cast<pid_t>(
        syscall(SYS_clone, CLONE_NEWNS | CLONE_NEWPID | SIGCHLD, nullptr, nullptr, nullptr, 0));
}

int ChildWatch(const OPTIONS &options, const HOST &host)
{
    int watcher[2] = {-1, -1};
    if (pipe2(watcher, O_CLOEXEC) != 0) {
        (void)ComplainErrno("cannot start");
        return STATUS_NOT_REHEARSED;
    }
    (void)fflush(nullptr);
    const pid_t pid = NamespacesFork();
    if (pid < 0) {
        (void)ComplainErrno("cannot have mounts and processes of its own here");
        return STATUS_NOT_REHEARSED;
    }
    if (pid == 0) {
        (void)close(watcher[1]);
        const int status = ChildRun(options, host, watcher[0]);
        _exit(status);
    }
    int status = 0;
    if (waitpid(pid, &status, 0) != pid || !WIFEXITED(status)) {
        (void)Complain("the rehearsal came to no end");
        return STATUS_NOT_REHEARSED;
    }
    return WEXITSTATUS(status);
}

} // namespace

int main(int argc, char **argv)
{
    if (RecorderIsWanted()) {
        return RecorderRun(argc, argv);
    }
    OPTIONS options;
    if (!OptionsRead(argc, argv, &options)) {
        return STATUS_NOT_REHEARSED;
    }
    if (options.fHelp) {
        UsagePrint();
        return 0;
    }
    if (geteuid() != 0) {
        (void)Complain("only root can rehearse: it needs mounts of its own, and reads the disks");
        return STATUS_NOT_REHEARSED;
    }
    return ChildWatch(options, HostRead(options));
}
