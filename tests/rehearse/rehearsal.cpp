// SPDX-License-Identifier: MIT
#include "rehearsal.h"

#include "other_program.h"
#include "private_root.h"
#include "wire.h"
#include "words.h"

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <set>
#include <sys/stat.h>

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

// Nothing of these is the machine's: what the host lends, and what the harness writes.
const std::set<std::string> NOT_THE_MACHINE = {"usr",   "lib",    "lib32",
                                               "lib64", "libx32", ".sandbox"};

std::string FileLine(const std::string &szPath, const std::string &szShown)
{
    struct stat info = {};
    (void)lstat(szPath.c_str(), &info);
    std::string szLine = szShown + " " + std::to_string(info.st_mode) + " " +
                         std::to_string(info.st_size) + " " + std::to_string(info.st_mtim.tv_sec) +
                         "." + std::to_string(info.st_mtim.tv_nsec);
    if (S_ISREG(info.st_mode)) {
        szLine += " " + Quoted(FileText(szPath).value_or("unreadable"));
    }
    return szLine;
}

std::vector<std::string> Missing(const std::vector<std::string> &lines,
                                 const std::vector<std::string> &others)
{
    std::vector<std::string> missing;
    std::copy_if(lines.begin(), lines.end(), std::back_inserter(missing),
                 [&](const std::string &szLine) {
                     return std::find(others.begin(), others.end(), szLine) == others.end();
                 });
    return missing;
}

} // namespace

void RehearsalAdd(MACHINE &machine)
{
    MachineFile(machine, PROGRAM_PATH, ProgramBytes(), EXECUTABLE);
    MachineFile(machine, TOOL_PATH, TOOL_TEXT, EXECUTABLE);
}

const char *RehearsalProgram()
{
    return TESTED_REHEARSE;
}

void RehearsalToolAdd(MACHINE &machine, const std::string &szScript)
{
    MachineFile(machine, REHEARSAL_OWN_TOOL, "#!/bin/sh\nPATH=/usr/bin\n" + szScript, EXECUTABLE);
}

std::vector<std::string> RehearsalWords(const std::vector<std::string> &arguments)
{
    std::vector<std::string> words = {PROGRAM_PATH, "--tool", TOOL_PATH};
    words.insert(words.end(), arguments.begin(), arguments.end());
    return words;
}

RUN_RESULT RehearsalTry(MACHINE machine, const std::vector<std::string> &arguments)
{
    RehearsalAdd(machine);
    return MachineTryOther(machine, RehearsalWords(arguments));
}

std::vector<std::string> RehearsalPicture()
{
    namespace fs = std::filesystem;
    std::vector<std::string> lines = SplitLines(FileText("/proc/self/mountinfo").value_or(""));
    const std::string szRoot = PrivateRootFolder();
    fs::recursive_directory_iterator entry(szRoot);
    for (; entry != fs::recursive_directory_iterator(); ++entry) {
        if (entry.depth() == 0 && NOT_THE_MACHINE.contains(entry->path().filename())) {
            entry.disable_recursion_pending();
            continue;
        }
        const std::string szPath = entry->path();
        lines.push_back(FileLine(szPath, szPath.substr(szRoot.size())));
    }
    std::sort(lines.begin(), lines.end());
    return lines;
}

std::string RehearsalDifference(const std::vector<std::string> &before,
                                const std::vector<std::string> &after)
{
    constexpr size_t SHOWN = 300;
    std::string szText;
    for (const std::string &szLine : Missing(before, after)) {
        szText += "    before: " + szLine.substr(0, SHOWN) + "\n";
    }
    for (const std::string &szLine : Missing(after, before)) {
        szText += "    after: " + szLine.substr(0, SHOWN) + "\n";
    }
    return szText;
}
