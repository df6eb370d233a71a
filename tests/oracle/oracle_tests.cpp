// SPDX-License-Identifier: MIT
//
// Runs the finished program on random machines in the sandbox and asks the model what it must do.
//
//     oracle_tests [--machines N] [--seed S] [--jobs J] [--show]
//
// Machine i is made from seed S + i (S is the environment's ORACLE_SEED unless given), so a failing
// one comes back with "--machines 1 --seed" and its seed. --show prints machines and answers.
#include "wire.h"
#include "oracle_compare.h"
#include "oracle_machine.h"
#include "oracle_model.h"
#include "sandbox.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

using std::string;
using std::to_string;
using std::vector;
using u64 = std::uint64_t;

constexpr u64 MACHINES_DEFAULT = 2000;
constexpr u64 SEED_DEFAULT = 1;
constexpr u64 JOBS_DEFAULT = 2;
constexpr u64 PROGRESS_STEP = 250;
constexpr int BOUND = 60000; // milliseconds; the machine may be busy with something else
constexpr const char SHELL[] = "/bin/sh";
constexpr const char MD0_MEMBER[] = "/sys/block/md0/md/dev-";
constexpr char MARK_PASSED = '.';
constexpr char MARK_FAILED = 'F';

struct OPTIONS {
    u64 machines = MACHINES_DEFAULT;
    u64 seed = SEED_DEFAULT;
    u64 jobs = JOBS_DEFAULT;
    bool fShow = false;
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
    answer.nTimes = nTimes;
    return answer;
}

void ToolsLayOut(const ORACLE_MACHINE &machine, MACHINE &made)
{
    for (const auto &[szKey, replies] : machine.replies) {
        for (size_t i = 0; i < replies.size(); i++) {
            const bool fLast = i + 1 == replies.size();
            MachineTool(made, KeyPattern(szKey), AnswerOf(replies[i], fLast ? ANY_TIMES : 1));
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

// A partitioner that is recorded as ever, and then kills who called it.
void KillerLayOut(const ORACLE_MACHINE &machine, MACHINE &made)
{
    string patterns;
    for (const auto &[szKey, replies] : machine.replies) {
        if (replies[0].fKillCaller) {
            const vector<string> words = OracleShellWords(szKey);
            string arguments;
            for (size_t i = 1; i < words.size(); i++) {
                const bool fGap = i == 1 && words[1].compare(0, 2, "-N") == 0;
                arguments += (i == 1 ? "" : " ") + words[i] + (fGap ? " '*'" : "");
            }
            patterns += (patterns.empty() ? "'" : "|'") + arguments + "'";
        }
    }
    if (patterns.empty() || machine.missing.count(ORACLE_SFDISK) != 0) {
        return;
    }
    const string szStandin = "exec -a " + string(ORACLE_SFDISK) + " " WIRE_STANDIN " \"$@\"";
    made.tools[ORACLE_SFDISK] = TOOL_KIND::MISSING; // the stand-in of it, that is
    made.fMayLeaveChildren = true;
    MachineFile(made, ORACLE_SFDISK,
                "#!/usr/bin/bash\ncase \"$*\" in\n" + patterns + ")\n    (" + szStandin +
                    ")\n    kill -KILL $PPID ;;\n*) " + szStandin + " ;;\nesac\n",
                0755);
}

MACHINE MachineLayOut(const ORACLE_CASE &subject, const vector<ORACLE_ANSWER> &answers)
{
    const ORACLE_MACHINE &machine = subject.machine;
    MACHINE made = MachineMake();
    made.msBound = BOUND;
    if (machine.szConf) {
        MachineConf(made, *machine.szConf);
    }
    SysfsLayOut(machine, made);
    HostsLayOut(machine, made);
    for (const string &szMarker : machine.markers) {
        MachineFile(made, szMarker, "");
    }
    ToolsLayOut(machine, made);
    KillerLayOut(machine, made);
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

// One answer for each order in which a directory may hand out the members of the system array.
vector<ORACLE_ANSWER> AnswersMake(const ORACLE_CASE &subject)
{
    vector<ORACLE_ANSWER> answers;
    ORACLE_MACHINE machine = subject.machine;
    std::sort(machine.md0Members.begin(), machine.md0Members.end());
    do {
        answers.push_back(OracleAnswer(machine, subject.words));
    } while (std::next_permutation(machine.md0Members.begin(), machine.md0Members.end()));
    return answers;
}

// The differences from the answer that comes nearest.
vector<string> CaseDifferences(const ORACLE_CASE &subject)
{
    const vector<ORACLE_ANSWER> answers = AnswersMake(subject);
    const MACHINE machine = MachineLayOut(subject, answers);
    const ORACLE_SEEN seen = SeenTake(subject, MachineTry(machine, subject.words));
    vector<string> nearest = OracleDifferences(answers[0], seen);
    for (const ORACLE_ANSWER &answer : answers) {
        const vector<string> differences = OracleDifferences(answer, seen);
        nearest = differences.size() < nearest.size() ? differences : nearest;
    }
    return nearest;
}

string AnswerText(const ORACLE_ANSWER &answer)
{
    static const std::map<ORACLE_KIND, string> names = {{ORACLE_KIND::COMMAND, "runs"},
                                                        {ORACLE_KIND::SHELL, "shell"},
                                                        {ORACLE_KIND::SLEEP, "sleeps"},
                                                        {ORACLE_KIND::LOG, "logs"},
                                                        {ORACLE_KIND::ERROR_LOG, "records"}};
    string text;
    for (size_t i = 0; i < answer.phases.size(); i++) {
        for (const ORACLE_STRAND &strand : answer.phases[i]) {
            for (const ORACLE_ACTION &action : strand.actions) {
                const string szWho = strand.szDisk.empty() ? "parent" : strand.szDisk;
                text += "  " + to_string(i) + " " + szWho + " " + names.at(action.kind) + " ";
                if (action.kind == ORACLE_KIND::COMMAND) {
                    for (const string &szWord : action.words) {
                        text += "[" + szWord + "]";
                    }
                } else {
                    text += to_string(action.nNumber) + " " + action.szText;
                }
                text += "\n";
            }
        }
    }
    return text + "  prints [" + answer.szOut + "], exit status " + to_string(answer.nStatus) +
           "\n";
}

// ------------------------------------------------------------------------------------- the suite

bool CaseRun(const OPTIONS &options, u64 seed)
{
    const ORACLE_CASE subject = OracleCaseMake(seed);
    string text;
    if (options.fShow) {
        text += "machine of seed " + to_string(seed) + "\n" + OracleCaseText(subject) +
                "its answer\n" + AnswerText(OracleAnswer(subject.machine, subject.words));
    }
    const vector<string> differences = CaseDifferences(subject);
    if (!differences.empty()) {
        text += "FAILED seed " + to_string(seed) + ": tool and model differ on this machine\n" +
                (options.fShow ? "" : OracleCaseText(subject));
        for (const string &szDifference : differences) {
            text += "difference in " + szDifference;
        }
        text += "again with: oracle_tests --machines 1 --seed " + to_string(seed) + "\n";
    }
    (void)fwrite(text.data(), 1, text.size(), stdout);
    (void)fflush(stdout);
    return differences.empty();
}

// Each worker has a sandbox of its own and tells the result of each machine with one byte.
void WorkerStart(const OPTIONS &options, u64 worker, int fdRead, int fdWrite)
{
    if (fork() != 0) {
        return;
    }
    close(fdRead);
    for (u64 i = worker; i < options.machines; i += options.jobs) {
        const char mark = CaseRun(options, options.seed + i) ? MARK_PASSED : MARK_FAILED;
        if (write(fdWrite, &mark, 1) != 1) {
            exit(EXIT_FAILURE);
        }
    }
    exit(EXIT_SUCCESS);
}

struct TALLY {
    u64 passed = 0;
    u64 failed = 0;
};

TALLY MarksCount(const OPTIONS &options, int fdRead)
{
    TALLY tally;
    char mark = 0;
    while (read(fdRead, &mark, 1) == 1) {
        (mark == MARK_PASSED ? tally.passed : tally.failed)++;
        const u64 done = tally.passed + tally.failed;
        if (done % PROGRESS_STEP == 0 && done < options.machines) {
            printf("oracle: %llu of %llu machines, %llu failed\n",
                   static_cast<unsigned long long>(done),
                   static_cast<unsigned long long>(options.machines),
                   static_cast<unsigned long long>(tally.failed));
            (void)fflush(stdout);
        }
    }
    return tally;
}

int RingRun(const OPTIONS &options)
{
    int fds[2] = {-1, -1};
    if (pipe(fds) != 0) {
        perror("oracle: pipe");
        return EXIT_FAILURE;
    }
    printf("oracle: %llu machines, seeds from %llu\n",
           static_cast<unsigned long long>(options.machines),
           static_cast<unsigned long long>(options.seed));
    (void)fflush(stdout);
    for (u64 worker = 0; worker < options.jobs; worker++) {
        WorkerStart(options, worker, fds[0], fds[1]);
    }
    close(fds[1]);
    TALLY tally = MarksCount(options, fds[0]);
    while (wait(nullptr) > 0) {
    }
    // A worker that broke down owes the rest of its machines.
    tally.failed = options.machines - tally.passed;
    printf("oracle: %llu passed, %llu failed\n", static_cast<unsigned long long>(tally.passed),
           static_cast<unsigned long long>(tally.failed));
    return tally.failed == 0 ? EXIT_SUCCESS : EXIT_FAILURE;
}

bool OptionsParse(int argc, char *argv[], OPTIONS &options)
{
    const char *szSeed = getenv("ORACLE_SEED");
    if (szSeed != nullptr && !OracleNumberParse(szSeed, options.seed)) {
        return false;
    }
    const std::pair<const char *, u64 *> numbers[] = {
        {"--machines", &options.machines}, {"--seed", &options.seed}, {"--jobs", &options.jobs}};
    for (int i = 1; i < argc; i++) {
        if (strcmp(argv[i], "--show") == 0) {
            options.fShow = true;
            continue;
        }
        const auto option = std::find_if(std::begin(numbers), std::end(numbers), [&](auto &entry) {
            return strcmp(entry.first, argv[i]) == 0;
        });
        if (option == std::end(numbers) || i + 1 == argc ||
            !OracleNumberParse(argv[++i], *option->second)) {
            return false;
        }
    }
    return options.machines > 0 && options.jobs > 0;
}

} // namespace

int main(int argc, char *argv[])
{
    OPTIONS options;
    if (!OptionsParse(argc, argv, options)) {
        fprintf(stderr, "usage: oracle_tests [--machines N] [--seed S] [--jobs J] [--show]\n");
        return EXIT_FAILURE;
    }
    return RingRun(options);
}
