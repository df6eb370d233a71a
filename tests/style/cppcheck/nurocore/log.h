// SPDX-License-Identifier: MIT
#pragma once

// What cppcheck reads in place of the real header: its preprocessor has no __VA_OPT__ yet.

#include <syslog.h>

void NLIBCLog(int priority, const char *szFormat, ...);
