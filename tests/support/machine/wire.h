// SPDX-License-Identifier: MIT
#pragma once

// What the harness, the stand-in tools and the interposing library send one another, and where.
// They may be built for different processors, so everything but the stand-ins' own counts is text:
// a field is "LENGTH:BYTES", a record is a field that holds the fields of the record.

#include <cstddef>
#include <fcntl.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <sys/un.h>
#include <unistd.h>

#define WIRE_FOLDER "/.sandbox"
#define WIRE_ROWS WIRE_FOLDER "/rows"       // the answers of the stand-ins
#define WIRE_USED WIRE_FOLDER "/used"       // how often each row was run, 4 bytes per row
#define WIRE_DRIVER WIRE_FOLDER "/driver"   // what requests answer, which calls fail
#define WIRE_MEETING WIRE_FOLDER "/meeting" // a byte for each stand-in that waits for others
#define WIRE_CALLS WIRE_FOLDER "/calls"     // every call that can be made to fail, one per line
#define WIRE_PROGRAM WIRE_FOLDER "/arrayctl"
#define WIRE_BODIES WIRE_FOLDER "/bodies" // bodies of another processor
#define WIRE_INTERPOSE WIRE_FOLDER "/interpose.so"
#define WIRE_STANDIN WIRE_FOLDER "/standin"
#define WIRE_SHELL WIRE_FOLDER "/sh"
#define WIRE_PROC WIRE_FOLDER "/proc" // the kernel's own, for sanitizers only

#define WIRE_ANY_ARGUMENT "*"
#define WIRE_ANY_REST "..."

// The socket of syslog, and where it is when the machine has none. What happened is sent there too,
// so that log lines, commands and sleeps come in one order.
#define WIRE_LOG "/dev/log"
#define WIRE_LOG_AWAY "/dev/log.away"

// The first field of a record of what happened.
#define WIRE_COMMAND "command"
#define WIRE_UNEXPECTED "unexpected"
#define WIRE_SLEEP "sleep"
#define WIRE_FAULT "fault"

// Sends the fields of one record. Uses no function that can be made to fail.
inline void WireSend(const char *pch, size_t cb)
{
    const struct sockaddr_un addresses[] = {{AF_UNIX, WIRE_LOG}, {AF_UNIX, WIRE_LOG_AWAY}};
    const long fd = syscall(SYS_socket, AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    for (const struct sockaddr_un &address : addresses) {
        if (syscall(SYS_sendto, fd, pch, cb, 0, &address, sizeof(address)) >= 0) {
            break;
        }
    }
    (void)syscall(SYS_close, fd);
}
