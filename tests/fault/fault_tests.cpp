// SPDX-License-Identifier: MIT
//
// Makes every call into the C library that can fail, fail in turn: once only, and from the n-th on.
//
//     fault_tests [--all] [--every N] [--thin N] [--minimum FILE] [--show] [FILTER]
//
// Without --all, each call of each process of each situation fails once, with one of its error
// numbers, and of the rest a part is run: one in N. --thin takes one in N of all that would be run,
// for a tool that is slow to start, as one with sanitizers is. --show tells every run that differs
// from the undisturbed one.
#include "judge.h"
#include "sandbox.h"
#include "situations.h"
#include "suite.h"
#include "verdict.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <sstream>

namespace
{

using std::string;
using std::to_string;
using STRINGS = std::vector<string>;

constexpr int CALLS_MAX = 2000; // a call that fails for ever ends the loop here
constexpr char EVERY_CALL[] = "*";

struct OPTIONS {
    bool fAll = false;
    bool fShow = false;
    std::uint64_t every = 8;
    std::uint64_t thin = 1;
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
        sweep.tally.allowed[AllowanceText(row)] += n;
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
    sweep.tally.done++;
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
           point / sweep.options.thin % VerdictWorkers() == sweep.worker;
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
    for (size_t row = 0; row < AllowanceCount(); row++) {
        sweep.tally.allowed[AllowanceText(row)] = 0; // one that nothing needs is told, too
    }
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

} // namespace

int main(int argc, char *argv[])
{
    OPTIONS options;
    const std::vector<SITUATION> situations = SituationsMake();
    SUITE suite = {.szDone = "injections", .work = [&](size_t test, size_t worker) {
                       return SituationSweep(options, situations[test], worker);
                   }};
    for (const SITUATION &situation : situations) {
        suite.names.push_back(situation.szName);
    }
    const bool fTaken = OptionsTake(argc, argv,
                                    {{"--all", &options.fAll},
                                     {"--every", &options.every},
                                     {"--thin", &options.thin},
                                     {"", &suite.szFilter},
                                     {"--minimum", &suite.szMinimum},
                                     {"--show", &options.fShow}});
    if (!fTaken) {
        return EXIT_FAILURE;
    }
    SuiteRun(suite);
    return EXIT_SUCCESS;
}
