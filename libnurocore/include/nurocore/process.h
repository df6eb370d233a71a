// SPDX-License-Identifier: MIT
#pragma once

// Child processes: a fork with a choice of what the child gives up, and running a program to its
// end.

#include <cstdarg>

// What a child of NLIBCFork does before it goes on, in this order.
constexpr unsigned int FORK_RESET_PRIORITY = 0x80;
constexpr unsigned int FORK_RESET_ENVIRONMENT = 0x08; // keeps PATH alone
constexpr unsigned int FORK_RELEASE_LOCKS = 0x02;
constexpr unsigned int FORK_STDIO_TO_NULL = 0x01;
constexpr unsigned int FORK_CLOSE_DESCRIPTORS = 0x04; // from 3 up; releases the locks too
constexpr unsigned int FORK_DAEMONIZE = 0x40;         // fork again; the grandchild continues
constexpr unsigned int FORK_NEW_SESSION = 0x20;
constexpr unsigned int FORK_CHDIR_ROOT = 0x10;

// For a program that is run and waited for.
constexpr unsigned int FORK_RUN_AND_WAIT = FORK_RESET_PRIORITY | FORK_NEW_SESSION |
                                           FORK_CHDIR_ROOT | FORK_RESET_ENVIRONMENT |
                                           FORK_RELEASE_LOCKS | FORK_STDIO_TO_NULL;

// The exit status of a child that could not run its program or fork again.
constexpr int CHILD_STATUS_FAILED = 255;

// Returns 0 in the child and its pid in the parent; with FORK_DAEMONIZE 1 in the parent once the
// first child has exited with 0, -1 when it has not. -1 with ERR_FORK_FAILED when fork fails.
int NLIBCFork(unsigned int flags);

// Runs szPath with the arguments that follow, up to a NULL, and waits for it. Returns its exit
// status 0 to 255 (255 also when it cannot be executed), 0 when it was already reaped elsewhere;
// -1 with ERR_CHILD_FAILED when it was killed or could not be forked, with ERR_BAD_PARAMETER for
// NULL.
[[gnu::sentinel]] int NLIBCExecl(const char *szPath, ...);

// fork for a worker whose standard streams are /dev/null; buffered output is not flushed first.
// Returns 0 in the child, its pid in the parent, -1 on failure (no code).
int NLIBCForkCloseIo();

// The argument vector {szPath, arguments up to a NULL, NULL} on the heap; the strings stay the
// caller's. NULL when there is no memory; no code is set.
char **NLIBCArgvAlloc(const char *szPath, va_list arguments);

// Opens /dev/null for every standard stream that is closed. Otherwise the next device or log socket
// that is opened would get its number, and would be written to when the tool prints something.
void NLIBCStdioOccupy();

// Makes /dev/null standard input, output and error; they stay as they are if it cannot be opened.
void NLIBCStdioToNull();
