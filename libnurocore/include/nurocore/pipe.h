// SPDX-License-Identifier: MIT
#pragma once

// Streams to and from a program that is run by its path with an argument list, never by a shell.

#include <cstdio>
#include <memory>

// Starts szPath with the arguments that follow, up to a NULL. Mode letters: "r" read what it
// writes, "w" write what it reads; with "r", "E" reads its standard error instead and "B" both;
// "e" keeps the stream close-on-exec; "p" means nothing. What is not piped is /dev/null.
// A program that cannot be executed shows as exit status 127 at NLIBCPclose.
// NULL on failure: ERR_BAD_PARAMETER, ERR_PIPE_FAILED, ERR_OUT_OF_MEMORY, ERR_FORK_FAILED or
// ERR_OPEN_FAILED. The stream is closed with NLIBCPclose.
[[gnu::sentinel]] FILE *NLIBCPopen(const char *szPath, const char *szMode, ...);

// The same with an argument vector that ends with NULL; the caller keeps ownership of it.
FILE *NLIBCPopenV(const char *szPath, const char *szMode, char *const argv[]);

// Closes the stream and waits for its program. Returns the raw wait status (exit status 1 is 256),
// 0 when the child was already reaped elsewhere; -1 with ERR_BAD_PARAMETER for NULL, with
// ERR_NO_SUCH_CHILD for a stream that NLIBCPopen did not open (it stays open) or a failed wait.
int NLIBCPclose(FILE *pStream);

// Closes a pipe stream at the end of a scope, for callers that do not ask how its program ended.
struct PIPE_DELETER {
    void operator()(FILE *pStream) const
    {
        (void)NLIBCPclose(pStream);
    }
};

using PIPE_OWNER = std::unique_ptr<FILE, PIPE_DELETER>;
