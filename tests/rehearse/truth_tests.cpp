// SPDX-License-Identifier: MIT
//
// Rehearses on random machines in the sandbox, then runs the tool on each: both have to name the
// same commands, byte for byte and in order for each disk, as no command fails.
//
//     rehearse_truth [--machines N] [--seed S] [SEED]
//
// Machine i is made from seed S + i, so a failing one comes back with its seed alone.
#include "oracle_layout.h"
#include "rehearsal.h"
#include "suite.h"

#include <algorithm>
#include <cstdlib>

namespace
{

using std::string;
using std::to_string;
using std::vector;
using u64 = std::uint64_t;

constexpr u64 MACHINES = 2000;

bool IsQuestion(const vector<string> &argv)
{
    return argv.size() > 1 && (argv[1] == "-E" || argv[1] == "-l" || argv[0] == "/sbin/pvs");
}

// No command fails, and a question is always answered in the same way.
ORACLE_CASE CaseMake(u64 seed)
{
    ORACLE_CASE subject = OracleCaseMake(seed);
    subject.seed = 0; // a real shell
    for (auto reply = subject.machine.replies.begin(); reply != subject.machine.replies.end();) {
        if (!IsQuestion(OracleShellWords(reply->first))) {
            reply = subject.machine.replies.erase(reply);
            continue;
        }
        reply->second.resize(1);
        reply->second[0].fKillCaller = false;
        ++reply;
    }
    return subject;
}

// The words of these tests need no quotes but for an empty one.
string LineOf(const vector<string> &argv)
{
    string szLine;
    for (const string &szWord : argv) {
        szLine += (szLine.empty() ? "" : " ") + (szWord.empty() ? "''" : szWord);
    }
    return szLine + '\n';
}

// The disk of a command that is one disk's; children of different disks work side by side.
string DiskOf(const string &szLine)
{
    const size_t iDisk = szLine.find("/dev/sd");
    const bool fOne = iDisk != string::npos && szLine.find("/dev/", iDisk + 1) == string::npos &&
                      szLine.find(" -C ") == string::npos;
    if (!fOne) {
        return "";
    }
    const string szPath = szLine.substr(iDisk, szLine.find_first_of(" \n", iDisk) - iDisk);
    return szPath.substr(0, szPath.find_first_of("0123456789"));
}

using STRANDS = std::map<string, string>;

void StrandAdd(const string &szLine, STRANDS &strands)
{
    strands[DiskOf(szLine)] += szLine;
}

STRANDS StrandsRun(const RUN_RESULT &result)
{
    STRANDS strands;
    for (const RUN_EVENT &event : result.events) {
        if (event.kind == EVENT_KIND::COMMAND && !IsQuestion(event.argv)) {
            StrandAdd(LineOf(event.argv), strands);
        }
    }
    return strands;
}

STRANDS StrandsRehearsed(const string &szOut)
{
    STRANDS strands;
    for (size_t iStart = 0; iStart < szOut.size();) {
        const size_t iEnd = std::min(szOut.find('\n', iStart), szOut.size() - 1) + 1;
        StrandAdd(szOut.substr(iStart, iEnd - iStart), strands);
        iStart = iEnd;
    }
    return strands;
}

string StrandsText(const STRANDS &strands)
{
    string text;
    for (const auto &[szDisk, szLines] : strands) {
        text += "    # " + (szDisk.empty() ? "all" : szDisk) + '\n' + szLines;
    }
    return text;
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
    const STRANDS told = StrandsRehearsed(rehearsed.szOut);
    const STRANDS done = StrandsRun(run);
    const bool fRehearsed = rehearsed.status == 0 || rehearsed.status == 3;
    if (fRehearsed && told == done) {
        return "";
    }
    return "the rehearsal ended with status " + to_string(rehearsed.status) + '\n' +
           rehearsed.szErr + OracleCaseText(subject) + "it told of\n" + StrandsText(told) +
           "the tool ran\n" + StrandsText(done);
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
