// SPDX-License-Identifier: MIT
#pragma once

// What the recorder tells the rehearsal through a socket, one message a connection, and how a
// message is written: the numbers, then each argument with a NUL behind it.

#include "text.h"

#include <cstdint>
#include <sys/types.h>

enum JOURNAL_KIND : std::int32_t {
    JOURNAL_RECORDED, // a command that was not run
    JOURNAL_QUESTION, // a question that is about to be passed on
    JOURNAL_ANSWERED, // it has been answered, with the status in wait's form
};

struct JOURNAL_HEAD {
    std::int32_t kind;
    std::int32_t pid;
    std::int32_t parent;
    std::int32_t status;
};

// Sends a message and waits until it is kept. False when there is no rehearsal to hear it.
bool JournalSend(const JOURNAL_HEAD &head, const WORDS &argv);

// Takes a message apart. False when it is none.
bool JournalParse(std::string_view message, JOURNAL_HEAD *pHead, WORDS *pArgv);
