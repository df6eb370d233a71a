// SPDX-License-Identifier: MIT
#pragma once

// Running the tool on the stage, and what was seen of that.

#include "text.h"

#include <sys/types.h>

// A program that the tool ran.
struct COMMAND {
    WORDS argv;
    pid_t pid;
    pid_t parent;
    bool fQuestion;
    int status; // of the real program, in wait's form, for a question that has been answered
};

struct LOG_LINE {
    int priority;       // as sent: 11 is an error of a user program, 15 a note for developers
    std::string szText; // without the time
};

struct RUN {
    std::vector<COMMAND> commands; // in the order in which they came
    std::vector<LOG_LINE> log;
    std::string szOut;
    std::string szErr;
    int status = 0;       // in wait's form
    bool fLogged = false; // the machine has a system log to take the place of
};

// Runs the tool with these arguments; its name is argv[0]. The journal listens, the other socket
// gets what goes to the system log. False, with a sentence, when it cannot be started.
bool RunTool(const WORDS &argv, int fdJournal, int fdSyslog, RUN *pRun);

// Runs a real program as the tool would, and returns what it prints; its errors go nowhere.
std::string RunQuestion(const WORDS &argv);
