// SPDX-License-Identifier: MIT
#pragma once

// The last-error record: what went wrong most recently in a library function, and where.
//
// One set of process-wide values, not per thread and not locked. It is never cleared: a success
// leaves the last failure in place, so read it only right after a call that reported a failure.

#include "nurocore/types.h"

// Codes are multiples of 0x100; no other code is ever set.
constexpr u32 ERR_BUF_TOO_SMALL = 0x0100;  // a value does not fit the caller's buffer
constexpr u32 ERR_OUT_OF_MEMORY = 0x0200;  // an allocation failed
constexpr u32 ERR_DEVICE_ABSENT = 0x0600;  // an md request answered ENODEV
constexpr u32 ERR_OPEN_FAILED = 0x0900;    // a file, device or stream could not be opened
constexpr u32 ERR_READ_FAILED = 0x0A00;    // nothing was read, or it could not be parsed
constexpr u32 ERR_BAD_PARAMETER = 0x0D00;  // a NULL argument, a bad range, a list in the wrong mode
constexpr u32 ERR_KEY_NOT_FOUND = 0x2000;  // no line of a key/value file holds the key
constexpr u32 ERR_CHILD_FAILED = 0x2A00;   // a program could not be run or waited for
constexpr u32 ERR_NO_MEMBER_DISK = 0x6100; // an array lists no member to ask for its UUID
constexpr u32 ERR_SYSCALL_FAILED = 0x8000; // an ioctl or glob failed for another reason
constexpr u32 ERR_PIPE_FAILED = 0x8100;    // a pipe could not be made
constexpr u32 ERR_FORK_FAILED = 0x9700;    // fork failed
constexpr u32 ERR_TEXT_NOT_FOUND = 0x9A00; // an expected word is missing in a text from sysfs
constexpr u32 ERR_INTERRUPTED = 0xA700;    // an md request answered EINTR
constexpr u32 ERR_BAD_FORMAT = 0xBE00;     // a name does not have the expected form
constexpr u32 ERR_OUT_OF_SPACE = 0xBF00;   // a joined text does not fit the caller's buffer
constexpr u32 ERR_NO_SUCH_CHILD = 0xE300;  // not from NLIBCPopen, or waiting for its child failed

// Overwrites the record. Only the address of szFile is stored, so it must be a constant.
void NLIBCErrSet(u32 code, const char *szFile, int line);

// The code of the last failure; 0 before any.
u32 NLIBCErrGet();

// The bare name of the source file that set it; NULL before any failure.
const char *NLIBCErrGetFile();

// The line in that file; 0 before any failure.
int NLIBCErrGetLine();

// Records a failure with the file and line of the call.
#define NLIBCErrSetHere(code) NLIBCErrSet((code), __FILE_NAME__, __LINE__)
