// SPDX-License-Identifier: MIT
#pragma once

// Reads an attribute of sysfs, a file of one line. The caller decides which code a failure gets and
// whether it is logged; the last-error record is not changed here.

#include <cstddef>
#include <sys/types.h>

constexpr ssize_t ATTRIBUTE_NOT_OPENED = -1;
constexpr ssize_t ATTRIBUTE_NOT_READ = 0;

// Stores at most cbText - 1 bytes of the file in szText, up to the read that has brought a line
// end. Returns how many bytes were read, or one of the above: NOT_OPENED with the errno of open,
// NOT_READ for a read error and for an empty file, with errno unchanged since the call.
ssize_t AttributeRead(const char *szFile, char *szText, size_t cbText);

// The same, but szText keeps the first line alone, including its line end.
ssize_t AttributeLineRead(const char *szFile, char *szText, size_t cbText);
