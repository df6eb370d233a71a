// SPDX-License-Identifier: MIT
#pragma once

#include <cstddef>

// The words of a command as logs tell them: the arguments up to a NULL with a blank between, each
// cut at cchArgumentMax characters, the whole where the buffer of cbText bytes ends.
void CommandTextBuild(const char *const argv[], size_t cchArgumentMax, char *szText, size_t cbText);
