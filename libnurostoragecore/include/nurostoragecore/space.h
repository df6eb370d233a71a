// SPDX-License-Identifier: MIT
#pragma once

// Runs the tools that change disks. What such a tool writes to standard error is the record of
// failed storage operations: one line per command in /var/log/space_operation_error.log.

#include <cstdio>

// Runs szPath with the arguments that follow, up to a NULL, and logs its standard error. Returns
// the raw wait status: 0 for exit status 0, exit status * 256 otherwise (32512 when it cannot be
// executed); -1 without a code when there is no memory for the arguments, with ERR_NO_SUCH_CHILD
// when the tool's end is not to be had, with ERR_BAD_PARAMETER for NULL. ERR_BAD_PARAMETER stands
// there too when the tool could not be started, whatever the reason: the log and the close are then
// asked about a stream that is NULL, and write over the code of the pipe stream.
[[gnu::sentinel]] int SpaceExecl(const char *szPath, ...);

// The same for a NULL-terminated vector that the caller owns, with the path in argv[0]. A caller
// that logs a failed command makes the text from the same vector.
int SpaceExecv(const char *const argv[]);

// Reads the stream to its end and, unless it was empty, appends a line with the time, szCommand
// (NULL is an empty text) and what was read to the log. Returns 0, or -1: ERR_BAD_PARAMETER for a
// NULL stream, no code when the log cannot be opened.
int SpaceErrorLog(FILE *pStream, const char *szCommand);
