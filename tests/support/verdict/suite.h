// SPDX-License-Identifier: MIT
#pragma once

// What the suites have in common that share their tests out among processes: options, workers, and
// what is told of each test.

#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <string>
#include <variant>
#include <vector>

// An option of the command line: a switch, a number of 1 or more, or a text. That without a name is
// the word that no option takes, the filter.
struct OPTION {
    const char *szName;
    std::variant<bool *, std::uint64_t *, std::string *> pTo;
};

// False for words that are none of these options, after a line that says how to use them.
bool OptionsTake(int argc, char *argv[], const std::vector<OPTION> &options);

// A number of 1 or more, and nothing behind it.
bool NumberTake(const char *szText, std::uint64_t &number);

// Random machines, each made from a seed of its own, so that one that fails comes back with it.
struct SEEDS {
    std::uint64_t machines;
    std::uint64_t first = 1;
};

// Takes the options --machines, --seed and a filter: one seed, which is one machine.
bool SeedsTake(int argc, char *argv[], SEEDS &seeds);

// Runs a suite in which each machine is one worker's test. The function says what is wrong with the
// machine of a seed; nothing is when that is empty.
void SeedsRun(const SEEDS &seeds, const std::function<std::string(std::uint64_t seed)> &wrongOf);

// What one worker finds out about its share of a test.
struct TALLY {
    std::uint64_t done = 0; // injections, kills, machines
    std::map<std::string, std::uint64_t> allowed =
        {};                              // why something may differ -> how often it did
    std::vector<std::string> wrong = {}; // a text, with its line end, for each
};

struct SUITE {
    std::vector<std::string> names = {}; // "COMMAND: what is special", where there is a minimum
    const char *szDone;                  // what is counted in each test; may be empty
    std::function<TALLY(size_t test, size_t worker)> work;
    std::string szFilter = {};  // of the tests that are run
    std::string szMinimum = {}; // a file of lines "COMMAND NUMBER": no fewer than once reached
};

// Every worker, one for each processor, does its share of every test, in a process of its own.
// Tells of each test as soon as all have done theirs, and at last how often what was allowed.
void SuiteRun(const SUITE &suite);
