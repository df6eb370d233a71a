// SPDX-License-Identifier: MIT
#pragma once

// What the harness, the stand-in tools and the interposing library tell one another, and where.
// They may be built for different processors, so everything but the stand-ins' own counts is text:
// a field is "LENGTH:BYTES", a record is a field that holds the fields of the record.

#define WIRE_FOLDER "/.sandbox"
#define WIRE_ROWS WIRE_FOLDER "/rows"             // the answers of the stand-ins
#define WIRE_USED WIRE_FOLDER "/used"             // how often each row was run, 4 bytes a row
#define WIRE_TRANSCRIPT WIRE_FOLDER "/transcript" // what happened, appended record by record
#define WIRE_DRIVER WIRE_FOLDER "/driver"         // what requests answer, which calls fail
#define WIRE_CALLS WIRE_FOLDER "/calls" // every call that can be made to fail, a line each
#define WIRE_PROGRAM WIRE_FOLDER "/arrayctl"
#define WIRE_BODIES WIRE_FOLDER "/bodies" // bodies of another processor
#define WIRE_INTERPOSE WIRE_FOLDER "/interpose.so"
#define WIRE_STANDIN WIRE_FOLDER "/standin"
#define WIRE_SHELL WIRE_FOLDER "/sh"
#define WIRE_PROC WIRE_FOLDER "/proc" // the kernel's own, for sanitizers alone

#define WIRE_ANY_ARGUMENT "*"
#define WIRE_ANY_REST "..."

// The first field of a record of the transcript.
#define WIRE_COMMAND "command"
#define WIRE_UNEXPECTED "unexpected"
#define WIRE_SLEEP "sleep"
#define WIRE_FAULT "fault"
