// SPDX-License-Identifier: MIT
#pragma once

#include <cstddef>

// Writes a command to szText as it is logged: the arguments up to a NULL, separated by blanks, each
// truncated to cchArgumentMax characters, the whole text to the buffer of cbText bytes.
void CommandTextBuild(const char *const argv[], size_t cchArgumentMax, char *szText, size_t cbText);
