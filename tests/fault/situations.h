// SPDX-License-Identifier: MIT
#pragma once

// The machines and commands that failing calls and kills are tried on.

#include "sandbox.h"

#include <string>
#include <vector>

struct SITUATION {
    std::string szName; // "COMMAND: what is special"
    MACHINE machine;
    std::vector<std::string> words; // of the command line
};

// A machine with these disks, all of them blank.
MACHINE WithBlankDisks(const std::string &szConf, const std::vector<std::string> &disks);

// The machine with tools that take whatever they are given: rows that answer once answer always,
// those that count on purpose keep their count, and what no row expects succeeds in silence.
MACHINE Relaxed(MACHINE machine);

// Their stand-ins answer as often as they are asked, and every tool takes whatever it is given:
// what a run did is judged afterwards.
std::vector<SITUATION> SituationsMake();
