// SPDX-License-Identifier: MIT
#pragma once

// What the harness, the stand-in tools and the interposing library send one another, and where.
// They may be built for different processors, so everything but the stand-ins' own counts is text.
// Rows and records are fields "LENGTH:BYTES", as they may hold any byte; a row is itself a field.
// The driver file is lines of words.
//
// Nothing here uses a function that can be made to fail, or wants more than the C library to run.

#include <charconv>
#include <cstddef>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <string_view>
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

// Takes the next field off a record. False at its end, and when what is there is no field.
inline bool WireTake(std::string_view &record, std::string_view &field)
{
    size_t cb = 0;
    const char *const pRecordEnd = record.data() + record.size();
    const auto [pEnd, error] = std::from_chars(record.data(), pRecordEnd, cb);
    if (error != std::errc() || pEnd == pRecordEnd || *pEnd != ':' ||
        static_cast<size_t>(pRecordEnd - pEnd) <= cb) {
        return false;
    }
    field = {pEnd + 1, cb};
    record.remove_prefix(static_cast<size_t>(field.data() + cb - record.data()));
    return true;
}

inline std::string_view WireField(std::string_view &record)
{
    std::string_view field;
    (void)WireTake(record, field);
    return field;
}

inline long WireNumber(std::string_view &record)
{
    const std::string_view field = WireField(record);
    long number = 0;
    (void)std::from_chars(field.data(), field.data() + field.size(), number);
    return number;
}

// A record of what happened. One that is too long does not parse any more, which fails the test.
struct WIRE_RECORD {
    size_t cb;
    char ach[65536];
};

inline void WireAdd(WIRE_RECORD &record, const char *sz)
{
    const size_t cbRoom = sizeof(record.ach) - record.cb;
    record.cb +=
        static_cast<size_t>(snprintf(record.ach + record.cb, cbRoom, "%zu:%s", strlen(sz), sz));
    record.cb = record.cb < sizeof(record.ach) ? record.cb : sizeof(record.ach) - 1;
}

inline void WireSend(const WIRE_RECORD &record)
{
    const struct sockaddr_un addresses[] = {{AF_UNIX, WIRE_LOG}, {AF_UNIX, WIRE_LOG_AWAY}};
    const long fd = syscall(SYS_socket, AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    for (const struct sockaddr_un &address : addresses) {
        if (syscall(SYS_sendto, fd, record.ach, record.cb, 0, &address, sizeof(address)) >= 0) {
            break;
        }
    }
    (void)syscall(SYS_close, fd);
}
