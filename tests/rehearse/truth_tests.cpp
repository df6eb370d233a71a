// SPDX-License-Identifier: MIT
//
// Rehearses on random machines in the sandbox, then runs the tool on each: both have to name the
// same commands, byte for byte and in order for each disk, as no command fails. What only asks has
// to be told with its output and its status.
//
//     rehearse_truth [--machines N] [--seed S] [SEED]
//
// Machine i is made from seed S + i, so a failing one comes back with its seed alone.
#include "array_machine.h"
#include "oracle_layout.h"
#include "oracle_strands.h"
#include "rehearsal.h"
#include "suite.h"
#include "verdict.h"

#include <algorithm>
#include <cstdlib>

namespace
{

using std::string;
using std::to_string;
using std::vector;
using u64 = std::uint64_t;

// One in so many has arrays to take apart or to report on, the others are to be set up.
constexpr u64 ARRAYS_EVERY = 6;
constexpr u64 MACHINES = 2400;

// What is rehearsed, and how many of the machines it is rehearsed on at least.
struct COMMAND_ROW {
    const char *szCommand;
    u64 nMin;
    bool fAsks; // it runs nothing that changes a disk, so its output and status are all there is
};

constexpr COMMAND_ROW COMMANDS[] = {
    {"initsys", 400, false},
    {"initsys-dd", 300, false},
    {"newvol", 300, false},
    {"destroy", 250, false},
    {"status", 60, true},
    {"enumformatalldisks", 300, true},
    {"enumformatalldisks_indualhead_install", 100, true},
};

struct TRUTH_CASE {
    MACHINE machine{};
    vector<string> words{};
    string szText{};     // the machine for a person
    bool fStops = false; // an array has to be stopped
};

// No command fails, and a question is always answered in the same way.
ORACLE_CASE OracleCaseTake(u64 seed)
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

TRUTH_CASE CaseMake(u64 seed)
{
    if (seed % ARRAYS_EVERY == 0) {
        const ARRAY_CASE subject = ArrayCaseMake(seed);
        return {subject.machine, subject.words, ArrayCaseText(subject), subject.fStops};
    }
    const ORACLE_CASE subject = OracleCaseTake(seed);
    return {OracleMachineLayOut(subject, {}), subject.words, OracleCaseText(subject), false};
}

const COMMAND_ROW &RowOf(const string &szCommand)
{
    return *std::find_if(std::begin(COMMANDS), std::end(COMMANDS),
                         [&](const COMMAND_ROW &row) { return row.szCommand == szCommand; });
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

// The lines below a title, as they were before they were moved in by two blanks.
string PartOf(const string &szText, const string &szTitle)
{
    string szPart;
    size_t iLine = szText.find("\n" + szTitle + "\n");
    iLine = iLine == string::npos ? szText.size() : iLine + szTitle.size() + 2;
    while (szText.compare(iLine, 2, "  ") == 0) {
        const size_t iEnd = szText.find('\n', iLine) + 1;
        szPart += szText.substr(iLine + 2, iEnd - iLine - 2);
        iLine = iEnd;
    }
    return szPart;
}

string LinesOf(const string &szOut)
{
    return szOut.empty() ? "nothing\n" : szOut + (szOut.back() == '\n' ? "" : "\n");
}

string AnswerDifference(const RUN_RESULT &rehearsed, const RUN_RESULT &run)
{
    const string szStatus = "\nIts exit status: " + to_string(run.status) + "\n";
    const bool fSame = rehearsed.szOut.ends_with(szStatus) &&
                       PartOf(rehearsed.szOut, "What it prints:") == LinesOf(run.szOut) &&
                       PartOf(rehearsed.szOut, "The commands:") == "none\n" && run.szErr.empty() &&
                       OracleStrandsRun(CommandsOf(run)).empty();
    return fSame ? "" : "it told\n" + rehearsed.szOut + "the tool printed\n" + run.szOut + szStatus;
}

string CommandsDifference(const TRUTH_CASE &subject, const RUN_RESULT &rehearsed,
                          const RUN_RESULT &run)
{
    const ORACLE_STRANDS strands = OracleStrandsRun(CommandsOf(run));
    const auto all = strands.find("");
    const bool fStopped =
        all != strands.end() &&
        all->second.find("/sbin/mdadm -S /dev/md" + subject.words.back() + "\n") != string::npos;
    return OracleStrandsDifference(OracleStrandsRehearsed(rehearsed.szOut), strands) +
           (subject.fStops && !fStopped ? "the array was not stopped\n" : "");
}

// What is wrong with the machine of this seed; empty when nothing is.
string CaseRun(u64 seed)
{
    const TRUTH_CASE subject = CaseMake(seed);
    const bool fAsks = RowOf(subject.words[0]).fAsks;
    vector<string> words = fAsks ? vector<string>{} : vector<string>{"--commands"};
    words.insert(words.end(), subject.words.begin(), subject.words.end());
    const RUN_RESULT rehearsed = RehearsalTry(subject.machine, words);
    const RUN_RESULT run = MachineTry(subject.machine, subject.words);
    const string szDifference =
        fAsks ? AnswerDifference(rehearsed, run) : CommandsDifference(subject, rehearsed, run);
    const bool fRehearsed = rehearsed.status == 0 || rehearsed.status == 3;
    if (fRehearsed && szDifference.empty()) {
        return "";
    }
    return "the rehearsal ended with status " + to_string(rehearsed.status) + '\n' +
           rehearsed.szErr + subject.szText + szDifference;
}

// A machine that is not told of any more is missed here.
void CommandsCount(const SEEDS &seeds)
{
    std::map<string, u64> counts;
    for (u64 seed = seeds.first; seed < seeds.first + seeds.machines; seed++) {
        counts[CaseMake(seed).words[0]]++;
    }
    for (const COMMAND_ROW &row : COMMANDS) {
        const string szCount = to_string(counts[row.szCommand]) + " machines";
        VerdictTell(string("enough of ") + row.szCommand,
                    counts[row.szCommand] < row.nMin ? szCount + "\n" : "", szCount);
    }
}

} // namespace

int main(int argc, char *argv[])
{
    SEEDS seeds = {.machines = MACHINES};
    if (!SeedsTake(argc, argv, seeds)) {
        return EXIT_FAILURE;
    }
    SeedsRun(seeds, CaseRun);
    if (seeds.machines >= MACHINES) {
        CommandsCount(seeds);
    }
    return EXIT_SUCCESS;
}
