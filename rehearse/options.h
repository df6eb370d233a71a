// SPDX-License-Identifier: MIT
#pragma once

// The command line: arrayctl-rehearse [--tool PATH] [--commands | --json] COMMAND [ARGUMENT...]

#include "text.h"

enum class FORM { TEXT, COMMANDS, JSON };

struct OPTIONS {
    std::string szTool;     // as it was typed, or "arrayctl"
    std::string szToolPath; // where it is
    FORM form;
    WORDS words; // the tool's own arguments
    bool fHelp;
};

// False, with a sentence, when the command line is none or the tool is not there.
bool OptionsRead(int argc, char **argv, OPTIONS *pOptions);

void UsagePrint();
