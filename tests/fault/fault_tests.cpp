// SPDX-License-Identifier: MIT
//
// Makes every call into the C library that can fail, fail in turn: once only, and from the n-th on.
//
//     fault_tests [--all] [--every N] [--thin N] [--jobs J] [--only TEXT] [--minimum FILE] [--show]
//
// Without --all, each call of each process of each situation fails once, with one of its error
// numbers, and of the rest a part is run: one in N. --thin takes one in N of all that would be run,
// for a tool that is slow to start, as one with sanitizers is. --only takes the situations whose
// name holds the text. --show tells every run that differs from the undisturbed one.
#include "judge.h"
#include "sandbox.h"
#include "situations.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <sstream>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

using std::string;
using std::to_string;
using STRINGS = std::vector<string>;

constexpr size_t EVERY_DEFAULT = 8;
constexpr size_t JOBS_DEFAULT = 2;
constexpr int CALLS_MAX = 2000; // a call that fails for ever ends the loop here
constexpr char EVERY_CALL[] = "*";

struct OPTIONS {
    bool fAll = false;
    bool fShow = false;
    size_t every = EVERY_DEFAULT;
    size_t thin = 1;
    size_t jobs = JOBS_DEFAULT;
    string szOnly = {};
    string szMinimum = {};
};

// ---- what can fail how -------------------------------------------------------------------------

struct CALL_ERRORS {
    const char *szFunction;
    std::vector<int> errors;
    int errorOnce = 0; // one that is retried for as long as it comes back
};

// Left out, as they cannot fail for what the tool gives them: the string and number functions,
// snprintf of plain words and numbers, getenv, fileno, feof, fnmatch, time, sched_yield, free.
// Sleeps that end early are told by no error number; syslog has no result, but what it allocates
// fails with malloc.
const CALL_ERRORS CALLS[] = {
    {"malloc", {ENOMEM}},
    {"calloc", {ENOMEM}},
    {"realloc", {ENOMEM}},
    {"strdup", {ENOMEM}},
    {"strndup", {ENOMEM}},
    {"open", {ENOENT, EACCES, EMFILE, ENXIO}},
    {"fopen", {ENOENT, EACCES, EMFILE, ENOMEM}},
    {"fdopen", {ENOMEM}},
    {"setmntent", {ENOENT, EMFILE}},
    {"getmntent_r", {EIO}},
    {"fgets", {EIO, EINTR}},
    {"fgetc", {EIO}},
    {"getline", {EIO, ENOMEM}},
    {"read", {EIO, EINTR}},
    {"close", {EIO}},
    {"fclose", {EIO, ENOSPC}},
    {"endmntent", {EIO}},
    {"fflush", {EIO}},
    {"pipe2", {EMFILE, ENFILE}},
    {"fork", {EAGAIN, ENOMEM}},
    {"execv", {ENOENT, EACCES, ENOMEM}},
    {"waitpid", {ECHILD, EINVAL, EINTR}, EINTR},
    {"dup2", {EMFILE, EINTR}},
    {"fcntl", {EBADF}},
    {"ioctl", {ENODEV, EINTR, EIO, ENOTTY}},
    {"fstat", {EIO}},
    {"stat", {ENOENT, EACCES}},
    {"access", {ENOENT, EACCES, EIO}},
    {"glob", {ENOMEM, EIO}},
    {"scandir", {ENOENT, ENOMEM}},
    {"rmdir", {EBUSY, ENOTEMPTY}},
    {"chdir", {EACCES}},
    {"setsid", {EPERM}},
    {"setpriority", {EACCES}},
    {"sigaction", {EINVAL}},
    {"clearenv", {ENOMEM}},
    {"setenv", {ENOMEM}},
    {"sysconf", {EINVAL}},
    {"system", {EAGAIN, ENOMEM}},
    {"localtime_r", {EOVERFLOW}},
    {"strftime", {ERANGE}},
    {"puts", {EIO, ENOSPC}},
    {"printf", {EIO, ENOSPC}},
    {"fprintf", {EIO, ENOSPC}},
    {EVERY_CALL, {ENOMEM, EIO}},
};

// What an undisturbed run calls: how often each process calls each function.
using CALL_COUNTS = std::map<std::pair<string, string>, int>;

CALL_COUNTS CallsCount(const STRINGS &calls)
{
    CALL_COUNTS counts;
    for (const string &szCall : calls) {
        std::istringstream words(szCall);
        string szProcess;
        string szFunction;
        words >> szProcess >> szFunction;
        counts[{szProcess, szFunction}]++;
        counts[{szProcess, EVERY_CALL}]++;
    }
    return counts;
}

// ---- one situation -----------------------------------------------------------------------------

struct TALLY {
    size_t injections = 0;
    std::map<size_t, size_t> allowed = {};
    STRINGS wrong = {};
};

struct SWEEP {
    const OPTIONS &options;
    const SITUATION &situation;
    RUN_RESULT clean;
    CALL_COUNTS counts;
    size_t worker;
    size_t nPoint;
    size_t nSkipped;
    TALLY tally;
};

string FaultName(const MACHINE_FAULT &fault)
{
    return fault.szFunction + " " + to_string(fault.nCall) + (fault.fGoOn ? " and on" : "") +
           " of process " + fault.szProcess + " fails with " + strerrorname_np(fault.error);
}

void VerdictTake(SWEEP &sweep, const MACHINE_FAULT &fault, const RUN_RESULT &result)
{
    const VERDICT verdict = Judge(sweep.situation, sweep.clean, result);
    for (const auto &[row, n] : verdict.allowed) {
        sweep.tally.allowed[row] += n;
    }
    string szText = sweep.situation.szName + ": " + FaultName(fault) + "\n";
    for (const string &szWrong : verdict.wrong) {
        szText += "    " + szWrong + "\n";
    }
    if (!verdict.wrong.empty()) {
        sweep.tally.wrong.push_back(szText + FaultText(result));
    } else if (sweep.options.fShow && !verdict.allowed.empty()) {
        for (const auto &[row, n] : verdict.allowed) {
            szText += "    allowed: " + AllowanceText(row) + "\n";
        }
        (void)fputs((szText + FaultText(result)).c_str(), stdout);
        (void)fflush(stdout);
    }
}

// False when the call was not made any more, so that nothing failed.
bool Inject(SWEEP &sweep, const MACHINE_FAULT &fault)
{
    MACHINE machine = sweep.situation.machine;
    machine.faults = {fault};
    const RUN_RESULT result = MachineTry(machine, sweep.situation.words);
    if (!WasInjected(result)) {
        return false;
    }
    sweep.tally.injections++;
    VerdictTake(sweep, fault, result);
    return true;
}

// Takes turns with the other workers, and leaves out what is not asked for.
bool IsDue(SWEEP &sweep, bool fAlways)
{
    if (!fAlways && !sweep.options.fAll && sweep.nSkipped++ % sweep.options.every != 0) {
        return false;
    }
    const size_t point = sweep.nPoint++;
    return point % sweep.options.thin == 0 &&
           point / sweep.options.thin % sweep.options.jobs == sweep.worker;
}

// One function of one process, all its calls. With --all the loop goes on until nothing fails.
void FunctionSweep(SWEEP &sweep, const CALL_ERRORS &call, const string &szProcess, int nCalls)
{
    const bool fWorld = strcmp(call.szFunction, EVERY_CALL) == 0;
    for (size_t iError = 0; iError < call.errors.size(); iError++) {
        for (const bool fGoOn : {false, true}) {
            if ((fWorld && !fGoOn) || (call.errors[iError] == call.errorOnce && fGoOn)) {
                continue;
            }
            for (int nCall = 1; nCall <= CALLS_MAX; nCall++) {
                const bool fTurn = static_cast<size_t>(nCall) % call.errors.size() == iError;
                if (nCall > nCalls && !sweep.options.fAll) {
                    break;
                }
                const MACHINE_FAULT fault = {.szFunction = call.szFunction,
                                             .nCall = nCall,
                                             .error = call.errors[iError],
                                             .fGoOn = fGoOn,
                                             .szProcess = szProcess};
                if (nCall > nCalls) {
                    if (!Inject(sweep, fault)) {
                        break;
                    }
                } else if (IsDue(sweep, !fGoOn && fTurn)) {
                    (void)Inject(sweep, fault);
                }
            }
        }
    }
}

const CALL_ERRORS *CallOf(const string &szFunction)
{
    const auto *const pFound =
        std::find_if(std::begin(CALLS), std::end(CALLS),
                     [&](const CALL_ERRORS &call) { return szFunction == call.szFunction; });
    return pFound == std::end(CALLS) ? nullptr : pFound;
}

TALLY SituationSweep(const OPTIONS &options, const SITUATION &situation, size_t worker)
{
    MACHINE machine = situation.machine;
    machine.fCallsTold = true;
    SWEEP sweep = {options, situation, MachineTry(machine, situation.words), {}, worker, 0, 0, {}};
    sweep.counts = CallsCount(MachineCalls());
    const VERDICT verdict = Judge(situation, sweep.clean, sweep.clean);
    for (const string &szWrong : verdict.wrong) {
        sweep.tally.wrong.push_back(situation.szName + ", undisturbed: " + szWrong + "\n");
    }
    for (const auto &[key, nCalls] : sweep.counts) {
        const CALL_ERRORS *const pCall = CallOf(key.second);
        if (pCall == nullptr) {
            sweep.tally.wrong.push_back(situation.szName + ": nobody says how " + key.second +
                                        " fails\n");
            continue;
        }
        FunctionSweep(sweep, *pCall, key.first, nCalls);
    }
    return sweep.tally;
}

// ---- workers -----------------------------------------------------------------------------------

// A worker tells of a situation in lines; the text of what is wrong comes indented after its line.
void TallyTell(FILE *pOut, size_t situation, const TALLY &tally)
{
    fprintf(pOut, "situation %zu %zu %zu\n", situation, tally.injections, tally.wrong.size());
    for (const auto &[row, n] : tally.allowed) {
        fprintf(pOut, "allowed %zu %zu\n", row, n);
    }
    for (const string &szWrong : tally.wrong) {
        fprintf(pOut, "wrong %s", szWrong.c_str());
    }
    (void)fflush(pOut);
}

void WorkerStart(const OPTIONS &options, const std::vector<SITUATION> &situations, size_t worker,
                 FILE *pOut)
{
    if (fork() != 0) {
        return;
    }
    for (size_t i = 0; i < situations.size(); i++) {
        TallyTell(pOut, i, SituationSweep(options, situations[i], worker));
    }
    (void)fclose(pOut);
    exit(EXIT_SUCCESS);
}

struct TOTALS {
    std::map<string, size_t> byCommand = {}; // injections
    std::map<size_t, size_t> reported = {};  // situation -> workers that told of it
    std::map<size_t, size_t> wrong = {};     // situation -> runs
    std::map<size_t, size_t> allowed = {};
    size_t injections = 0;
};

string CommandOf(const SITUATION &situation)
{
    return situation.szName.substr(0, situation.szName.find(':'));
}

void WorkerRead(const std::vector<SITUATION> &situations, FILE *pIn, TOTALS &totals)
{
    rewind(pIn);
    char *pszLine = nullptr;
    size_t cb = 0;
    while (getline(&pszLine, &cb, pIn) > 0) {
        size_t situation = 0;
        size_t first = 0;
        size_t second = 0;
        if (sscanf(pszLine, "situation %zu %zu %zu", &situation, &first, &second) == 3) {
            totals.reported[situation]++;
            totals.wrong[situation] += second;
            totals.byCommand[CommandOf(situations[situation])] += first;
            totals.injections += first;
        } else if (sscanf(pszLine, "allowed %zu %zu", &first, &second) == 2) {
            totals.allowed[first] += second;
        } else {
            (void)fputs(pszLine, stdout);
        }
    }
    free(pszLine);
    (void)fclose(pIn);
}

// ---- the minimum
// ---------------------------------------------------------------------------------

struct COUNTS {
    size_t passed = 0;
    size_t failed = 0;
};

void CountCheck(COUNTS &counts, bool fPassed, const string &szWhat)
{
    (fPassed ? counts.passed : counts.failed)++;
    if (!fPassed) {
        printf("FAILED: %s\n", szWhat.c_str());
    }
}

// Lines "COMMAND NUMBER": no fewer injections than were once reached.
void MinimumCheck(const OPTIONS &options, const TOTALS &totals, COUNTS &counts)
{
    FILE *const pMinimum = fopen(options.szMinimum.c_str(), "r");
    if (pMinimum == nullptr) {
        CountCheck(counts, false, "cannot read " + options.szMinimum);
        return;
    }
    char szCommand[64] = "";
    size_t minimum = 0;
    while (fscanf(pMinimum, "%63s %zu", szCommand, &minimum) == 2) {
        const auto found = totals.byCommand.find(szCommand);
        const size_t reached = found == totals.byCommand.end() ? 0 : found->second;
        CountCheck(counts, reached >= minimum,
                   string(szCommand) + " has " + to_string(reached) + " injections, it had " +
                       to_string(minimum));
    }
    (void)fclose(pMinimum);
}

// ---- the suite ----------------------------------------------------------------------------------

void TotalsPrint(const TOTALS &totals)
{
    for (size_t row = 0; row < AllowanceCount(); row++) {
        const auto found = totals.allowed.find(row);
        printf("allowed %zu times: %s\n", found == totals.allowed.end() ? 0 : found->second,
               AllowanceText(row).c_str());
    }
    for (const auto &[szCommand, n] : totals.byCommand) {
        printf("fault: %s %zu injections\n", szCommand.c_str(), n);
    }
}

int RingRun(const OPTIONS &options)
{
    using CLOCK = std::chrono::steady_clock;
    const CLOCK::time_point start = CLOCK::now();
    std::vector<SITUATION> situations = SituationsMake();
    std::erase_if(situations, [&](const SITUATION &situation) {
        return situation.szName.find(options.szOnly) == string::npos;
    });
    (void)fflush(stdout);
    std::vector<FILE *> told;
    for (size_t worker = 0; worker < options.jobs; worker++) {
        told.push_back(tmpfile());
        WorkerStart(options, situations, worker, told.back());
    }
    while (wait(nullptr) > 0) {
    }
    TOTALS totals;
    for (FILE *const pIn : told) {
        WorkerRead(situations, pIn, totals);
    }
    COUNTS counts;
    for (size_t i = 0; i < situations.size(); i++) {
        CountCheck(counts, totals.wrong[i] == 0 && totals.reported[i] == options.jobs,
                   situations[i].szName);
    }
    TotalsPrint(totals);
    if (!options.szMinimum.empty()) {
        MinimumCheck(options, totals, counts);
    }
    const auto seconds = std::chrono::duration_cast<std::chrono::seconds>(CLOCK::now() - start);
    printf("fault: %zu situations, %lld s\n", situations.size(),
           static_cast<long long>(seconds.count()));
    printf("fault: %zu injections\n", totals.injections);
    printf("fault: %zu passed, %zu failed\n", counts.passed, counts.failed);
    return counts.failed == 0 ? EXIT_SUCCESS : EXIT_FAILURE;
}

int Usage()
{
    fprintf(stderr, "usage: fault_tests [--all] [--every N] [--thin N] [--jobs J] "
                    "[--only TEXT] [--minimum FILE] [--show]\n");
    return EXIT_FAILURE;
}

bool OptionTake(OPTIONS &options, const string &szName, const char *szValue)
{
    if (szName == "--only") {
        options.szOnly = szValue;
    } else if (szName == "--minimum") {
        options.szMinimum = szValue;
    } else if (szName == "--every") {
        options.every = strtoul(szValue, nullptr, 10);
    } else if (szName == "--thin") {
        options.thin = strtoul(szValue, nullptr, 10);
    } else if (szName == "--jobs") {
        options.jobs = strtoul(szValue, nullptr, 10);
    } else {
        return false;
    }
    return options.every > 0 && options.thin > 0 && options.jobs > 0;
}

} // namespace

int main(int argc, char *argv[])
{
    OPTIONS options;
    for (int i = 1; i < argc; i++) {
        const string szName = argv[i];
        if (szName == "--all") {
            options.fAll = true;
        } else if (szName == "--show") {
            options.fShow = true;
        } else if (i + 1 >= argc || !OptionTake(options, szName, argv[++i])) {
            return Usage();
        }
    }
    return RingRun(options);
}
