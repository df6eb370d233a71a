// SPDX-License-Identifier: MIT
#pragma once

// What the libraries read in place of the machine. Calls into the C library that open a fixed path
// are redirected by the linker (see CMakeLists.txt): they find the files that the target laid out,
// and of /proc, /sys and /etc.defaults nothing else. Nothing is logged, but every line is put
// together, so that a sanitizer sees its arguments.

#include <string_view>

// All files and the output of the tools are gone.
void OutsideClear();

// A file of the machine; the text must live until OutsideClear.
void OutsideFile(const char *szPath, std::string_view text);

// What every tool prints that is run for its output.
void OutsideToolOutput(std::string_view text);
