// SPDX-License-Identifier: MIT
#include "rehearsal.h"

#include "other_program.h"
#include "wire.h"

#include <fstream>
#include <iterator>

namespace
{

constexpr char PROGRAM_PATH[] = "/usr.rehearse/arrayctl-rehearse";
constexpr char TOOL_PATH[] = "/usr.rehearse/arrayctl";

// The tool needs the library that answers for the driver; the rehearsal itself must not have it.
constexpr char TOOL_TEXT[] = "#!/bin/sh\n"
                             "LD_PRELOAD=" WIRE_INTERPOSE " exec " WIRE_PROGRAM " \"$@\"\n";

constexpr mode_t EXECUTABLE = 0755;

const std::string &ProgramBytes()
{
    static const std::string bytes = [] {
        std::ifstream file(TESTED_REHEARSE, std::ios::binary);
        return std::string(std::istreambuf_iterator<char>(file), {});
    }();
    return bytes;
}

} // namespace

RUN_RESULT RehearsalTry(MACHINE machine, std::vector<std::string> arguments)
{
    MachineFile(machine, PROGRAM_PATH, ProgramBytes(), EXECUTABLE);
    MachineFile(machine, TOOL_PATH, TOOL_TEXT, EXECUTABLE);
    arguments.insert(arguments.begin(), {PROGRAM_PATH, "--tool", TOOL_PATH});
    return MachineTryOther(machine, arguments);
}
