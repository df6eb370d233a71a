// SPDX-License-Identifier: MIT
//
// Rehearses on random machines in the sandbox, then runs the tool on each: both have to name the
// same commands, byte for byte and in order for each disk, as no command fails.
//
//     rehearse_truth [--machines N] [--seed S] [SEED]
//
// Machine i is made from seed S + i, so a failing one comes back with its seed alone.
#include "oracle_layout.h"
#include "oracle_strands.h"
#include "rehearsal.h"
#include "suite.h"

#include <cstdlib>

namespace
{

using std::string;
using std::to_string;
using std::vector;
using u64 = std::uint64_t;

constexpr u64 MACHINES = 2000;

// No command fails, and a question is always answered in the same way.
ORACLE_CASE CaseMake(u64 seed)
{
    ORACLE_CASE subject = OracleCaseMake(seed);
    subject.seed = 0; // a real shell
    for (auto reply = subject.machine.replies.begin(); reply != subject.machine.replies.end();) {
        if (!OracleIsQuestion(OracleShellWords(reply->first))) {
            reply = subject.machine.replies.erase(reply);
            continue;
        }
        reply->second.resize(1);
        reply->second[0].fKillCaller = false;
        ++reply;
    }
    return subject;
}

vector<ORACLE_WORDS> CommandsOf(const RUN_RESULT &result)
{
    vector<ORACLE_WORDS> commands;
    for (const RUN_EVENT &event : result.events) {
        if (event.kind == EVENT_KIND::COMMAND) {
            commands.push_back(event.argv);
        }
    }
    return commands;
}

// What is wrong with the machine of this seed; empty when nothing is.
string CaseRun(u64 seed)
{
    const ORACLE_CASE subject = CaseMake(seed);
    const MACHINE machine = OracleMachineLayOut(subject, {});
    vector<string> words = {"--commands"};
    words.insert(words.end(), subject.words.begin(), subject.words.end());
    const RUN_RESULT rehearsed = RehearsalTry(machine, words);
    const RUN_RESULT run = MachineTry(machine, subject.words);
    const string szDifference = OracleStrandsDifference(OracleStrandsRehearsed(rehearsed.szOut),
                                                        OracleStrandsRun(CommandsOf(run)));
    const bool fRehearsed = rehearsed.status == 0 || rehearsed.status == 3;
    if (fRehearsed && szDifference.empty()) {
        return "";
    }
    return "the rehearsal ended with status " + to_string(rehearsed.status) + '\n' +
           rehearsed.szErr + OracleCaseText(subject) + szDifference;
}

} // namespace

int main(int argc, char *argv[])
{
    SEEDS seeds = {.machines = MACHINES};
    if (!SeedsTake(argc, argv, seeds)) {
        return EXIT_FAILURE;
    }
    SeedsRun(seeds, CaseRun);
    return EXIT_SUCCESS;
}
