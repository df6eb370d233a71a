// SPDX-License-Identifier: MIT
#pragma once

// The commands of a run, as they can be compared with those of another one: children of different
// disks work side by side, so only the commands of each disk, and those of none, have an order.

#include "oracle_model.h"

#include <map>
#include <string>
#include <vector>

// A disk's path, or nothing, and its commands, one line each.
using ORACLE_STRANDS = std::map<std::string, std::string>;

// A call of a tool that changes nothing.
bool OracleIsQuestion(const ORACLE_WORDS &words);

// Questions and pauses are left out.
ORACLE_STRANDS OracleStrandsRun(const std::vector<ORACLE_WORDS> &calls);

// Of the lines that a rehearsal lists.
ORACLE_STRANDS OracleStrandsRehearsed(const std::string &szLines);

// Empty when both are the same.
std::string OracleStrandsDifference(const ORACLE_STRANDS &rehearsed, const ORACLE_STRANDS &run);
