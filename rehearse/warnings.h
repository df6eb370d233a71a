// SPDX-License-Identifier: MIT
#pragma once

// What should make a person stop before the real run.

#include "outcome.h"

struct SCENE {
    const OPTIONS &options;
    const HOST &host;
    const RUN &run;
    const INVENTORY &inventory;
    const OUTCOME &outcome;
};

struct WARNING {
    const char *szKind; // a word for programs
    std::string szText; // a sentence with its evidence
};

std::vector<WARNING> WarningsFind(const SCENE &scene);
