// SPDX-License-Identifier: MIT
//
// Runs the finished program on random machines in the sandbox and asks the model what it must do.
//
//     oracle_tests [--machines N] [--seed S] [SEED]
//
// Machine i is made from seed S + i (S is the environment's ORACLE_SEED unless given), so a failing
// one comes back with its seed alone.
#include "oracle_compare.h"
#include "oracle_machine.h"
#include "oracle_model.h"
#include "sandbox.h"
#include "suite.h"
#include "verdict.h"

#include <algorithm>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace
{

using std::string;
using std::to_string;
using std::vector;
using u64 = std::uint64_t;

constexpr char SEED_OF[] = "seed ";
constexpr const char SHELL[] = "/bin/sh";
constexpr const char MD0_MEMBER[] = "/sys/block/md0/md/dev-";

struct OPTIONS {
    u64 machines = 2000;
    u64 seed = 1;
};

// Half of the machines have a stand-in for the shell: the exact text that it is given is compared.
// The others have a real shell, so the argument lists that come of the text are.
bool ShellIsStandin(const ORACLE_CASE &subject)
{
    return subject.seed % 2 == 1;
}

// ------------------------------------------------------------------- the machine in the sandbox

void SysfsLayOut(const ORACLE_MACHINE &machine, MACHINE &made)
{
    for (const auto &[szName, table] : machine.disks) {
        const string szDisk = "/sys/block/" + szName;
        MachineFolder(made, szDisk);
        for (const auto &[number, partition] : table) {
            const string szFolder = szDisk + "/" + szName + to_string(number);
            MachineFolder(made, szFolder);
            if (partition.szStart) {
                MachineFile(made, szFolder + "/start", *partition.szStart);
            }
            if (partition.szSize) {
                MachineFile(made, szFolder + "/size", *partition.szSize);
            }
        }
    }
    for (const string &szMember : machine.md0Members) {
        MachineFolder(made, MD0_MEMBER + szMember);
    }
}

void HostsLayOut(const ORACLE_MACHINE &machine, MACHINE &made)
{
    const string szHosts = "/sys/class/scsi_host";
    if (!machine.fScsiHostFolder) {
        MachineRemove(made, szHosts);
        return;
    }
    for (const auto &[szHost, szInfo] : machine.hosts) {
        MachineFolder(made, szHosts + "/" + szHost);
        if (szInfo) {
            MachineFile(made, szHosts + "/" + szHost + "/nuro_pm_info", *szInfo);
        }
    }
}

// The argument list that a reply's key stands for.
vector<string> KeyPattern(const string &szKey)
{
    constexpr size_t WORDS_SYSTEM = 10;
    constexpr size_t WORDS_DATA = 11;
    vector<string> words = OracleShellWords(szKey);
    if (words[0] == ORACLE_NURODD || (words.size() > 1 && words[1] == "-C")) {
        words.emplace_back(ANY_REST);
    } else if (words.size() > 1 && words[1].compare(0, 2, "-N") == 0) {
        const size_t count = words[1] == "-N3" ? WORDS_DATA : WORDS_SYSTEM;
        words.insert(words.end() - 1, count - words.size(), ANY_ARGUMENT);
    }
    return words;
}

TOOL_ANSWER AnswerOf(const ORACLE_REPLY &reply, int nTimes)
{
    TOOL_ANSWER answer;
    answer.szOut = reply.szOut;
    answer.szErr = reply.szErr;
    answer.status = reply.nExit;
    answer.signalCaller = reply.fKillCaller ? SIGKILL : 0;
    answer.nTimes = nTimes;
    return answer;
}

void ToolsLayOut(const ORACLE_MACHINE &machine, MACHINE &made)
{
    for (const auto &[szKey, replies] : machine.replies) {
        for (size_t i = 0; i < replies.size(); i++) {
            const bool fLast = i + 1 == replies.size();
            MachineTool(made, KeyPattern(szKey), AnswerOf(replies[i], fLast ? ANY_TIMES : 1));
            made.fMayLeaveChildren = made.fMayLeaveChildren || replies[i].fKillCaller;
        }
    }
    for (const char *szProgram : {ORACLE_MDADM, ORACLE_SFDISK, ORACLE_NURODD}) {
        MachineTool(made, vector<string>{szProgram, ANY_REST}, AnswerOf({}, ANY_TIMES));
    }
    for (const string &szProgram : machine.missing) {
        made.tools[szProgram] = TOOL_KIND::MISSING;
    }
}

// A stand-in for the shell answers for the tool that the text would have run.
void ShellLayOut(const vector<ORACLE_ANSWER> &answers, MACHINE &made)
{
    made.tools[SHELL] = TOOL_KIND::STANDIN;
    for (const ORACLE_ANSWER &answer : answers) {
        for (const ORACLE_ACTION &action : answer.phases.back().back().actions) {
            if (action.kind == ORACLE_KIND::SHELL) {
                ORACLE_REPLY reply;
                reply.nExit = action.nNumber;
                MachineTool(made, vector<string>{"sh", "-c", action.szText},
                            AnswerOf(reply, ANY_TIMES));
            }
        }
    }
    MachineTool(made, vector<string>{"sh", ANY_REST}, AnswerOf({}, ANY_TIMES));
}

MACHINE MachineLayOut(const ORACLE_CASE &subject, const vector<ORACLE_ANSWER> &answers)
{
    const ORACLE_MACHINE &machine = subject.machine;
    MACHINE made = MachineMake();
    if (machine.szConf) {
        MachineConf(made, *machine.szConf);
    }
    SysfsLayOut(machine, made);
    HostsLayOut(machine, made);
    for (const string &szMarker : machine.markers) {
        MachineFile(made, szMarker, "");
    }
    ToolsLayOut(machine, made);
    if (ShellIsStandin(subject)) {
        ShellLayOut(answers, made);
    }
    return made;
}

// ---------------------------------------------------------------------------- what came of a run

// A line of the operation error log without its time stamp.
vector<string> ErrorLogTake()
{
    vector<string> lines;
    const string szAll = MachineFileRead(ORACLE_ERROR_LOG_PATH).value_or("");
    for (size_t at = 0; at < szAll.size();) {
        const size_t end = std::min(szAll.find('\n', at), szAll.size());
        lines.push_back(OracleErrorLineMask(szAll.substr(at, end - at)));
        at = end + 1;
    }
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
    seen.fShellText = ShellIsStandin(subject);
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
    const MACHINE machine = MachineLayOut(subject, answers);
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

void MachinesTry(const OPTIONS &options)
{
    // Each machine is one worker's.
    SUITE suite = {.szDone = "", .work = [&](size_t test, size_t worker) {
                       TALLY tally;
                       const string szWrong =
                           test % VerdictWorkers() == worker ? CaseRun(options.seed + test) : "";
                       if (!szWrong.empty()) {
                           tally.wrong.push_back(szWrong);
                       }
                       return tally;
                   }};
    for (u64 i = 0; i < options.machines; i++) {
        suite.names.push_back(SEED_OF + to_string(options.seed + i));
    }
    (void)SuiteRun(suite);
}

// One seed is one machine.
bool FilterTake(OPTIONS &options, const string &szFilter)
{
    if (szFilter.empty()) {
        return true;
    }
    options.machines = 1;
    const size_t cbPrefix = szFilter.starts_with(SEED_OF) ? strlen(SEED_OF) : 0;
    return NumberTake(szFilter.c_str() + cbPrefix, options.seed);
}

} // namespace

int main(int argc, char *argv[])
{
    OPTIONS options;
    string szFilter;
    const char *const szSeed = getenv("ORACLE_SEED");
    const bool fSeed = szSeed == nullptr || NumberTake(szSeed, options.seed);
    if (!fSeed ||
        !OptionsTake(
            argc, argv,
            {{"--machines", &options.machines}, {"--seed", &options.seed}, {"", &szFilter}}) ||
        !FilterTake(options, szFilter)) {
        return EXIT_FAILURE;
    }
    MachinesTry(options);
    return EXIT_SUCCESS;
}
