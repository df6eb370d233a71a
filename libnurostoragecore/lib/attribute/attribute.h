// SPDX-License-Identifier: MIT
#pragma once

// One attribute of sysfs: a file of one line. What a failure is worth, in codes and in the log, is
// the caller's business; the last-error record is left alone.

#include <cstddef>
#include <sys/types.h>

constexpr ssize_t ATTRIBUTE_NOT_OPENED = -1;
constexpr ssize_t ATTRIBUTE_NOT_READ = 0;

// Reads at most cbText - 1 bytes of the file and leaves the first line of them in szText, its line
// end included. Returns how many bytes were read, or one of the above: NOT_OPENED with errno saying
// why, NOT_READ for a read error and for a file without a byte, with errno as at the call.
ssize_t AttributeRead(const char *szFile, char *szText, size_t cbText);
