// SPDX-License-Identifier: MIT
#pragma once

// Compares what a run left behind with what the model says. Children of one phase run side by side,
// so the commands of each disk are compared in their order, and their lines without one.

#include "oracle_model.h"

#include <string>
#include <utility>
#include <vector>

// What was seen of one run.
struct ORACLE_SEEN {
    std::vector<ORACLE_WORDS> commands{}; // in order; a pause is "sleep" and its seconds
    bool fShellText = false; // commands of a shell are seen as "sh", "-c" and their text
    std::vector<std::pair<int, std::string>> lines{}; // priority and whole syslog line, in order
    std::vector<std::string> errorLog{};              // lines without their time stamp
    std::string szOut{};
    std::string szErr{};
    int nStatus = 0;
    std::set<std::string> markers{};
    std::vector<std::string> problems{}; // anything that is wrong by itself
};

// One answer for each order in which a directory may hand out the members of the system array.
std::vector<ORACLE_ANSWER> OracleAnswers(ORACLE_MACHINE machine, const ORACLE_WORDS &words);

// One text for each difference from the answer that comes nearest; none when model and run agree.
std::vector<std::string> OracleDifferences(const std::vector<ORACLE_ANSWER> &answers,
                                           const ORACLE_SEEN &seen);
