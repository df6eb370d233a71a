// SPDX-License-Identifier: MIT
#include "options.h"

#include "text.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

namespace
{

constexpr char USAGE[] =
    "usage: arrayctl-rehearse [--tool PATH] [--commands | --json] COMMAND [ARGUMENT...]\n"
    "\n"
    "Runs `arrayctl COMMAND` without changing anything, and tells what it would do to the disks.\n"
    "\n"
    "  --tool PATH   rehearse this program instead of the arrayctl that a shell would find\n"
    "  --commands    print the commands alone, one a line\n"
    "  --json        print everything for a program\n"
    "\n"
    "Exit status: 0 nothing speaks against it, 3 something does, 2 it could not be rehearsed.\n";

constexpr char DEFAULT_TOOL[] = "arrayctl";
constexpr char DEFAULT_SEARCH_PATH[] = "/usr/sbin:/usr/bin:/sbin:/bin";

bool IsProgram(const std::string &szPath)
{
    struct stat info = {};
    return stat(szPath.c_str(), &info) == 0 && S_ISREG(info.st_mode) &&
           access(szPath.c_str(), X_OK) == 0;
}

// As a shell does: a name without a slash is searched for.
bool ToolFind(OPTIONS *pOptions)
{
    if (pOptions->szTool.find('/') != std::string::npos) {
        pOptions->szToolPath = pOptions->szTool;
        return IsProgram(pOptions->szTool) ||
               Complain("%s is no program", pOptions->szTool.c_str());
    }
    const char *const szSearch = getenv("PATH");
    for (const std::string &szFolder :
         Split(szSearch == nullptr ? DEFAULT_SEARCH_PATH : szSearch, ':')) {
        pOptions->szToolPath = szFolder + "/" + pOptions->szTool;
        if (!szFolder.empty() && IsProgram(pOptions->szToolPath)) {
            return true;
        }
    }
    return Complain("no program %s in PATH; --tool names one", pOptions->szTool.c_str());
}

bool FormTake(OPTIONS *pOptions, FORM form)
{
    if (pOptions->form != FORM::TEXT && pOptions->form != form) {
        return Complain("--commands and --json exclude each other");
    }
    pOptions->form = form;
    return true;
}

// Takes the option at *pArg. False when it is none, or lacks its value.
bool OptionTake(int argc, char **argv, int *pArg, OPTIONS *pOptions)
{
    const std::string szOption = argv[*pArg];
    if (szOption == "--help" || szOption == "-h") {
        pOptions->fHelp = true;
        return true;
    }
    if (szOption == "--commands") {
        return FormTake(pOptions, FORM::COMMANDS);
    }
    if (szOption == "--json") {
        return FormTake(pOptions, FORM::JSON);
    }
    if (szOption == "--tool" && *pArg + 1 < argc) {
        pOptions->szTool = argv[++*pArg];
        return true;
    }
    return Complain("no such option, or one without its value: %s", szOption.c_str());
}

} // namespace

bool OptionsRead(int argc, char **argv, OPTIONS *pOptions)
{
    *pOptions = {
        .szTool = DEFAULT_TOOL, .szToolPath = "", .form = FORM::TEXT, .words = {}, .fHelp = false};
    int iArg = 1;
    for (; iArg < argc && argv[iArg][0] == '-'; iArg++) {
        if (!OptionTake(argc, argv, &iArg, pOptions)) {
            return false;
        }
    }
    if (pOptions->fHelp) {
        return true;
    }
    pOptions->words.assign(argv + iArg, argv + argc);
    if (pOptions->words.empty()) {
        return Complain("no command is given; see --help");
    }
    return ToolFind(pOptions);
}

void UsagePrint()
{
    (void)fputs(USAGE, stdout);
}
