// SPDX-License-Identifier: MIT
#pragma once

// The one way to write a syslog line: source file and line come first, so that a line in the log
// leads to the code that wrote it. LOG_ERR for what ends an operation and for the tool's own notes,
// LOG_DEBUG for what a caller reports again. The log is opened with no identity or facility of its
// own.

#include <syslog.h>

// __extension__ stops -Wpedantic from warning about "%m", which is syslog's own conversion.
#define NLIBCLog(priority, format, ...)                                                            \
    __extension__(                                                                                 \
        syslog((priority), "%s:%d " format, __FILE_NAME__, __LINE__ __VA_OPT__(, ) __VA_ARGS__))
