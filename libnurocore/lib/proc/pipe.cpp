// SPDX-License-Identifier: MIT
#include "nurocore/pipe.h"

#include "nurocore/error.h"
#include "nurocore/handle.h"
#include "nurocore/log.h"
#include "nurocore/process.h"
#include "nurocore/types.h"
#include "pipe_internal.h"

#include <atomic>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <paths.h>
#include <sched.h>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

constexpr u32 SPIN_ATTEMPTS = 65536;
constexpr int STATUS_NOT_EXECUTED = 127;

struct PIPE_STREAM {
    FILE *pStream;
    i32 pid;
    PIPE_STREAM *pNext;
};

PIPE_STREAM *g_pStreams = nullptr; // newest first
std::atomic<u32> g_streamsLock = 0;

// What the letters of a mode ask for.
struct PIPE_MODE {
    bool fRead;
    bool fWrite;
    bool fKeepCloseOnExec;
    bool fStderrOnly;
    bool fStderrToo;
};

bool ModeLetterTake(char ch, PIPE_MODE &mode)
{
    switch (ch) {
    case 'r':
        mode.fRead = true;
        return true;
    case 'w':
        mode.fWrite = true;
        return true;
    case 'e':
        mode.fKeepCloseOnExec = true;
        return true;
    case 'E':
        mode.fStderrOnly = true;
        return true;
    case 'B':
        mode.fStderrToo = true;
        return true;
    default:
        return ch == 'p';
    }
}

bool ModeParse(const char *szMode, PIPE_MODE &mode)
{
    for (const char *pch = szMode; *pch != '\0'; pch++) {
        if (!ModeLetterTake(*pch, mode)) {
            return false;
        }
    }
    return mode.fRead != mode.fWrite;
}

void CloseOnExecClear(int fd)
{
    if (fcntl(fd, F_SETFD, 0) != 0) {
        NLIBCLog(LOG_ERR, "fcntl failed, %m");
    }
}

// A tool must not run if its output cannot be redirected: it would write to our own streams.
void MakeStandard(int fd, int fdStandard)
{
    if (fd == fdStandard) {
        CloseOnExecClear(fd);
    } else if (dup2(fd, fdStandard) < 0) {
        _exit(STATUS_NOT_EXECUTED);
    }
}

void StandardStreamsSet(const PIPE_MODE &mode, int fdPipe)
{
    const bool fPiped[] = {
        mode.fWrite,
        mode.fRead && !mode.fStderrOnly,
        mode.fRead && (mode.fStderrOnly || mode.fStderrToo),
    };
    for (int fd = STDIN_FILENO; fd <= STDERR_FILENO; fd++) {
        if (fPiped[fd]) {
            MakeStandard(fdPipe, fd);
        }
    }
    const int fdNull = open(_PATH_DEVNULL, O_RDWR);
    if (fdNull < 0) {
        return;
    }
    for (int fd = STDIN_FILENO; fd <= STDERR_FILENO; fd++) {
        if (!fPiped[fd]) {
            (void)dup2(fdNull, fd);
        }
    }
    if (fdNull > STDERR_FILENO) {
        (void)close(fdNull);
    }
}

// The parent's other streams: this program must not keep their pipes open.
void OtherStreamsClose()
{
    for (const PIPE_STREAM *p = g_pStreams; p != nullptr; p = p->pNext) {
        if (fileno(p->pStream) > STDERR_FILENO) {
            (void)close(fileno(p->pStream));
        }
    }
}

[[noreturn]] void ChildRun(const char *szPath, const PIPE_MODE &mode, int fdPipe,
                           char *const argv[])
{
    StandardStreamsSet(mode, fdPipe);
    OtherStreamsClose();
    (void)execv(szPath, argv);
    _exit(STATUS_NOT_EXECUTED);
}

// In the parent: turns its end of the pipe into a registered stream, which then owns both.
FILE *StreamRegister(HEAP_OWNER<PIPE_STREAM> &pRecord, const PIPE_MODE &mode, FD_OWNER &fdOurs)
{
    if (!mode.fKeepCloseOnExec) {
        CloseOnExecClear(fdOurs.get());
    }
    FILE *const pStream = fdopen(fdOurs.get(), mode.fRead ? "r" : "w");
    if (pStream == nullptr) {
        NLIBCErrSetHere(ERR_OPEN_FAILED);
        return nullptr;
    }
    (void)fdOurs.release();
    pRecord->pStream = pStream;
    (void)PipeStreamsLock();
    pRecord->pNext = g_pStreams;
    g_pStreams = pRecord.release();
    PipeStreamsUnlock();
    return pStream;
}

// Takes the stream's record out of the registry; NULL when it has none. The lock must be held.
PIPE_STREAM *StreamUnlink(const FILE *pStream)
{
    PIPE_STREAM **pp = &g_pStreams;
    while (*pp != nullptr && (*pp)->pStream != pStream) {
        pp = &(*pp)->pNext;
    }
    PIPE_STREAM *const pRecord = *pp;
    if (pRecord != nullptr) {
        *pp = pRecord->pNext;
    }
    return pRecord;
}

} // namespace

u32 PipeStreamsLock()
{
    u32 nFailed = 0;
    while (g_streamsLock.exchange(1) != 0) {
        if (++nFailed % SPIN_ATTEMPTS == 0) {
            (void)sched_yield();
        }
    }
    return nFailed;
}

void PipeStreamsUnlock()
{
    std::atomic_thread_fence(std::memory_order_seq_cst);
    g_streamsLock.store(0, std::memory_order_relaxed);
}

FILE *NLIBCPopenV(const char *szPath, const char *szMode, char *const argv[])
{
    PIPE_MODE mode = {};
    if (szPath == nullptr || szMode == nullptr || argv == nullptr || !ModeParse(szMode, mode)) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return nullptr;
    }
    int fdPipe[2] = {-1, -1};
    if (pipe2(fdPipe, O_CLOEXEC) != 0) {
        NLIBCErrSetHere(ERR_PIPE_FAILED);
        return nullptr;
    }
    HEAP_OWNER<PIPE_STREAM> pRecord(static_cast<PIPE_STREAM *>(calloc(1, sizeof(PIPE_STREAM))));
    if (pRecord == nullptr) {
        // Kept: the pipe is not closed here. A process without memory for 24 bytes is about to end.
        NLIBCErrSetHere(ERR_OUT_OF_MEMORY);
        return nullptr;
    }
    FD_OWNER fdOurs(fdPipe[mode.fRead ? 0 : 1]);
    FD_OWNER fdTheirs(fdPipe[mode.fRead ? 1 : 0]);

    // Forked under the lock, so that the child never inherits a half-changed registry.
    (void)PipeStreamsLock();
    const pid_t pid = fork();
    if (pid == 0) {
        ChildRun(szPath, mode, fdTheirs.get(), argv);
    }
    pRecord->pid = pid;
    PipeStreamsUnlock();

    fdTheirs.reset();
    if (pid < 0) {
        NLIBCErrSetHere(ERR_FORK_FAILED);
        return nullptr;
    }
    return StreamRegister(pRecord, mode, fdOurs);
}

FILE *NLIBCPopen(const char *szPath, const char *szMode, ...)
{
    if (szPath == nullptr || szMode == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return nullptr;
    }
    va_list arguments;
    va_start(arguments, szMode);
    const HEAP_OWNER<char *> argv(NLIBCArgvAlloc(szPath, arguments));
    va_end(arguments);
    if (argv == nullptr) {
        NLIBCErrSetHere(ERR_OUT_OF_MEMORY);
        return nullptr;
    }
    return NLIBCPopenV(szPath, szMode, argv.get());
}

int NLIBCPclose(FILE *pStream)
{
    if (pStream == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    (void)PipeStreamsLock();
    const HEAP_OWNER<PIPE_STREAM> pRecord(StreamUnlink(pStream));
    if (pRecord != nullptr) {
        (void)fclose(pStream);
    }
    PipeStreamsUnlock();
    if (pRecord == nullptr) {
        NLIBCErrSetHere(ERR_NO_SUCH_CHILD);
        return -1;
    }
    int status = 0;
    while (waitpid(pRecord->pid, &status, 0) < 0) {
        if (errno == ECHILD) {
            return 0;
        }
        if (errno != EINTR) {
            NLIBCErrSetHere(ERR_NO_SUCH_CHILD);
            return -1;
        }
    }
    return status;
}
