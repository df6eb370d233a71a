// SPDX-License-Identifier: MIT
//
// Runs the finished program on random machines in the sandbox and asks the model what it must do.
//
//     oracle_tests [--machines N] [--seed S] [SEED]
//
// Machine i is made from seed S + i (S is the environment's ORACLE_SEED unless given), so a failing
// one comes back with its seed alone.
#include "oracle_compare.h"
#include "oracle_layout.h"
#include "oracle_machine.h"
#include "oracle_model.h"
#include "sandbox.h"
#include "suite.h"
#include "words.h"

#include <algorithm>
#include <cstdlib>

namespace
{

using std::string;
using std::vector;
using u64 = std::uint64_t;

constexpr u64 MACHINES = 2000;

// ---------------------------------------------------------------------------- what came of a run

// A line of the operation error log without its time stamp.
vector<string> ErrorLogTake()
{
    vector<string> lines = SplitLines(MachineFileRead(ORACLE_ERROR_LOG_PATH).value_or(""));
    std::transform(lines.begin(), lines.end(), lines.begin(), OracleErrorLineMask);
    return lines;
}

// The rows of the sandbox are only answers here: what was run is compared by the model.
bool IsProblem(const string &szProblem)
{
    return szProblem.compare(0, 9, "expected ") != 0 &&
           szProblem.compare(0, 27, "not called by its own path:") != 0;
}

ORACLE_SEEN SeenTake(const ORACLE_CASE &subject, const RUN_RESULT &result)
{
    constexpr int PRIORITY_MASK = 7;
    ORACLE_SEEN seen;
    seen.fShellText = OracleShellIsStandin(subject);
    for (const RUN_EVENT &event : result.events) {
        seen.commands.push_back(event.argv);
    }
    for (const LOG_LINE &line : result.log) {
        seen.lines.emplace_back(line.priority & PRIORITY_MASK, line.szText);
    }
    seen.errorLog = ErrorLogTake();
    seen.szOut = result.szOut;
    seen.szErr = result.szErr;
    seen.nStatus = result.status;
    for (const char *szMarker : {ORACLE_MARKER_FORCE, ORACLE_MARKER_DUAL, ORACLE_MARKER_SINGLE,
                                 "/tmp/raid.0", "/tmp/raid.1", "/tmp/raid.5"}) {
        if (MachineFileRead(szMarker)) {
            seen.markers.insert(szMarker);
        }
    }
    std::copy_if(result.problems.begin(), result.problems.end(), std::back_inserter(seen.problems),
                 IsProblem);
    return seen;
}

vector<string> CaseDifferences(const ORACLE_CASE &subject)
{
    const vector<ORACLE_ANSWER> answers = OracleAnswers(subject.machine, subject.words);
    const MACHINE machine = OracleMachineLayOut(subject, answers);
    const ORACLE_SEEN seen = SeenTake(subject, MachineTry(machine, subject.words));
    return OracleDifferences(answers, seen);
}

// ------------------------------------------------------------------------------------- the suite

// What is wrong with the machine of this seed; empty when nothing is.
string CaseRun(u64 seed)
{
    const ORACLE_CASE subject = OracleCaseMake(seed);
    const vector<string> differences = CaseDifferences(subject);
    if (differences.empty()) {
        return "";
    }
    string text = "tool and model differ on this machine\n" + OracleCaseText(subject);
    for (const string &szDifference : differences) {
        text += "difference in " + szDifference;
    }
    return text;
}

} // namespace

int main(int argc, char *argv[])
{
    SEEDS seeds = {.machines = MACHINES};
    const char *const szSeed = getenv("ORACLE_SEED");
    const bool fSeed = szSeed == nullptr || NumberTake(szSeed, seeds.first);
    if (!fSeed || !SeedsTake(argc, argv, seeds)) {
        return EXIT_FAILURE;
    }
    SeedsRun(seeds, CaseRun);
    return EXIT_SUCCESS;
}
