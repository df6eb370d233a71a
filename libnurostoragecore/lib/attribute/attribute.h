// SPDX-License-Identifier: MIT
#pragma once

// Reads an attribute of sysfs, a file of one line. The caller decides which code a failure gets and
// whether it is logged; the last-error record is not changed here.

#include <cstddef>
#include <sys/types.h>

constexpr ssize_t ATTRIBUTE_NOT_OPENED = -1;
constexpr ssize_t ATTRIBUTE_NOT_READ = 0;

// Reads at most cbText - 1 bytes of the file and stores the first line of them in szText, including
// its line end. Returns how many bytes were read, or one of the above: NOT_OPENED with the errno of
// open, NOT_READ for a read error and for an empty file, with errno unchanged since the call.
ssize_t AttributeRead(const char *szFile, char *szText, size_t cbText);
