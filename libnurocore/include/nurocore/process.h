// SPDX-License-Identifier: MIT
#pragma once

// Children: a fork that can be told what the child leaves behind, and run-and-wait.

#include <cstdarg>

// What a child of NLIBCFork does before it goes on, in this order.
constexpr unsigned int FORK_RESET_PRIORITY = 0x80;
constexpr unsigned int FORK_RESET_ENVIRONMENT = 0x08; // keeps PATH alone
constexpr unsigned int FORK_RELEASE_LOCKS = 0x02;
constexpr unsigned int FORK_STDIO_TO_NULL = 0x01;
constexpr unsigned int FORK_CLOSE_DESCRIPTORS = 0x04; // from 3 up; releases the locks too
constexpr unsigned int FORK_DAEMONIZE = 0x40;         // a grandchild goes on in its place
constexpr unsigned int FORK_NEW_SESSION = 0x20;
constexpr unsigned int FORK_CHDIR_ROOT = 0x10;

// What a program runs with that is only waited for.
constexpr unsigned int FORK_RUN_AND_WAIT = FORK_RESET_PRIORITY | FORK_NEW_SESSION |
                                           FORK_CHDIR_ROOT | FORK_RESET_ENVIRONMENT |
                                           FORK_RELEASE_LOCKS | FORK_STDIO_TO_NULL;

// The status of a child that could not do what it was made for.
constexpr int CHILD_STATUS_FAILED = 255;

// Returns 0 in the child and its pid in the parent; with FORK_DAEMONIZE 1 in the parent once the
// first child has ended well, -1 when it has not. -1 with ERR_FORK_FAILED when fork fails.
int NLIBCFork(unsigned int flags);

// Runs szPath with the arguments that follow, up to a NULL, and waits for it. Returns its exit
// status 0 to 255 (255 also when it cannot be executed), 0 when somebody else has reaped it; -1
// with ERR_CHILD_FAILED when it was killed or there was no child, with ERR_BAD_PARAMETER for NULL.
[[gnu::sentinel]] int NLIBCExecl(const char *szPath, ...);

// fork for a worker whose standard streams are /dev/null; buffered output is not flushed first.
// Returns 0 in the child, its pid in the parent, -1 on failure (no code).
int NLIBCForkCloseIo();

// The argument vector {szPath, arguments up to a NULL, NULL} on the heap; the strings stay the
// caller's. NULL without a code when there is no memory.
char **NLIBCArgvAlloc(const char *szPath, va_list arguments);

// Puts /dev/null where a standard stream is closed: a device or the system log would get its number
// next, and what is printed with it.
void NLIBCStdioOccupy();

// Makes /dev/null standard input, output and error; they stay as they are if it does not open.
void NLIBCStdioToNull();
