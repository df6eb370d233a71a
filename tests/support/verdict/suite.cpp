// SPDX-License-Identifier: MIT
#include "suite.h"

#include "verdict.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <sstream>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

constexpr size_t WRONG_SHOWN = 5; // texts of one worker in one test
constexpr size_t WRONG_SIZE = 32768;
constexpr size_t REPORT_SIZE = 65536;

constexpr char MINIMUM_OF[] = "minimum of ";
constexpr char SEED_OF[] = "seed ";

using std::string;
using std::to_string;

struct TEST_TOTAL {
    std::uint64_t reports = 0; // workers that have told of it
    std::uint64_t done = 0;
    std::map<string, std::uint64_t> allowed = {};
    string szWrong = {};
};

// ---- options -----------------------------------------------------------------------------------

bool OptionTake(const OPTION &option, const char *szValue)
{
    if (auto *const *const ppszText = std::get_if<string *>(&option.pTo)) {
        **ppszText = szValue;
        return true;
    }
    return NumberTake(szValue, *std::get<std::uint64_t *>(option.pTo));
}

void UsageTell(const std::vector<OPTION> &options)
{
    constexpr const char *VALUES[] = {"", " N", " TEXT"};
    string szUsage = string("usage: ") + program_invocation_short_name;
    for (const OPTION &option : options) {
        szUsage += string(" [") + option.szName + VALUES[option.pTo.index()] + "]";
    }
    fprintf(stderr, "%s\n", szUsage.c_str());
}

// ---- the whole ---------------------------------------------------------------------------------

// A minimum is about all tests.
bool IsWhole(const SUITE &suite)
{
    return suite.szFilter.empty() || suite.szFilter.starts_with(MINIMUM_OF);
}

bool IsWanted(const SUITE &suite, size_t test)
{
    return IsWhole(suite) || VerdictWanted(suite.names[test], suite.szFilter);
}

void MinimumCheck(const SUITE &suite, std::map<string, std::uint64_t> &byCommand)
{
    std::ifstream file(suite.szMinimum);
    string szCommand;
    std::uint64_t minimum = 0;
    VerdictTell(string(MINIMUM_OF) + "all", file.good() ? "" : "cannot read " + suite.szMinimum);
    while (file >> szCommand >> minimum) {
        const string szReached = to_string(byCommand[szCommand]) + " " + suite.szDone;
        VerdictTell(string(MINIMUM_OF) + szCommand,
                    byCommand[szCommand] >= minimum ? ""
                                                    : szReached + ", it had " + to_string(minimum),
                    szReached);
    }
}

void TotalsTell(const SUITE &suite, const std::vector<TEST_TOTAL> &totals)
{
    std::map<string, std::uint64_t> allowed;
    std::map<string, std::uint64_t> byCommand;
    std::uint64_t done = 0;
    for (size_t test = 0; test < totals.size(); test++) {
        byCommand[suite.names[test].substr(0, suite.names[test].find(':'))] += totals[test].done;
        done += totals[test].done;
        for (const auto &[szReason, n] : totals[test].allowed) {
            allowed[szReason] += n;
        }
    }
    for (const auto &[szReason, n] : allowed) {
        printf("allowed %s times: %s\n", to_string(n).c_str(), szReason.c_str());
    }
    if (!suite.szMinimum.empty() && IsWhole(suite)) {
        MinimumCheck(suite, byCommand);
    }
    if (*suite.szDone != '\0') {
        printf("%s %s in all\n", to_string(done).c_str(), suite.szDone);
    }
}

// ---- workers -----------------------------------------------------------------------------------

// The texts of what was wrong, as many as a report has room for.
string WrongText(const TALLY &tally)
{
    string szText;
    for (size_t i = 0; i < std::min(tally.wrong.size(), WRONG_SHOWN); i++) {
        szText += tally.wrong[i];
    }
    szText.resize(std::min(szText.size(), WRONG_SIZE));
    return tally.wrong.empty() ? "" : to_string(tally.wrong.size()) + " wrong\n" + szText;
}

// One packet: test, count and number of reasons; a line for every reason; what was wrong.
void TallySend(int fd, size_t test, const TALLY &tally)
{
    string szReport = to_string(test) + " " + to_string(tally.done) + " " +
                      to_string(tally.allowed.size()) + "\n";
    for (const auto &[szReason, n] : tally.allowed) {
        szReport += to_string(n) + " " + szReason + "\n";
    }
    szReport += WrongText(tally);
    if (send(fd, szReport.data(), szReport.size(), 0) < 0) {
        exit(EXIT_FAILURE);
    }
}

void WorkerStart(const SUITE &suite, size_t worker, const int (&fds)[2])
{
    if (fork() != 0) {
        return;
    }
    close(fds[0]);
    for (size_t test = 0; test < suite.names.size(); test++) {
        if (IsWanted(suite, test)) {
            TallySend(fds[1], test, suite.work(test, worker));
        }
    }
    exit(EXIT_SUCCESS);
}

size_t ReportTake(const string &szReport, std::vector<TEST_TOTAL> &totals)
{
    std::istringstream lines(szReport);
    size_t test = 0;
    std::uint64_t done = 0;
    size_t nReason = 0;
    lines >> test >> done >> nReason;
    TEST_TOTAL &total = totals[test];
    total.reports++;
    total.done += done;
    string szReason;
    for (std::uint64_t n = 0; nReason > 0 && lines >> n && lines.get(); nReason--) {
        (void)std::getline(lines, szReason);
        total.allowed[szReason] += n;
    }
    (void)std::getline(lines >> std::ws, szReason, '\0');
    total.szWrong += lines ? szReason : "";
    return test;
}

void TestTell(const SUITE &suite, size_t test, const TEST_TOTAL &total)
{
    const string szBroken = total.reports < VerdictWorkers() ? "a worker broke down\n" : "";
    const string szNote = *suite.szDone == '\0' ? "" : to_string(total.done) + " " + suite.szDone;
    VerdictTell(suite.names[test], szBroken + total.szWrong, szNote);
}

} // namespace

bool NumberTake(const char *szText, std::uint64_t &number)
{
    char *pEnd = nullptr;
    number = strtoull(szText, &pEnd, 10);
    return number > 0 && *pEnd == '\0';
}

bool OptionsTake(int argc, char *argv[], const std::vector<OPTION> &options)
{
    for (int i = 1; i < argc; i++) {
        const string szName = strncmp(argv[i], "--", 2) == 0 ? argv[i] : "";
        const auto option = std::find_if(options.begin(), options.end(),
                                         [&](const OPTION &one) { return one.szName == szName; });
        if (option != options.end() && option->pTo.index() == 0) {
            *std::get<bool *>(option->pTo) = true;
            continue;
        }
        i += szName.empty() ? 0 : 1; // the filter is its own value
        if (option == options.end() || i >= argc || !OptionTake(*option, argv[i])) {
            UsageTell(options);
            return false;
        }
    }
    return true;
}

void SuiteRun(const SUITE &suite)
{
    int fds[2] = {-1, -1};
    if (socketpair(AF_UNIX, SOCK_SEQPACKET, 0, fds) != 0) {
        perror("workers");
        exit(EXIT_FAILURE);
    }
    (void)fflush(nullptr);
    for (size_t worker = 0; worker < VerdictWorkers(); worker++) {
        WorkerStart(suite, worker, fds);
    }
    close(fds[1]);
    std::vector<TEST_TOTAL> totals(suite.names.size());
    string szReport(REPORT_SIZE, '\0');
    for (ssize_t cb = 0; (cb = recv(fds[0], szReport.data(), szReport.size(), 0)) > 0;) {
        const size_t test = ReportTake(szReport.substr(0, static_cast<size_t>(cb)), totals);
        if (totals[test].reports == VerdictWorkers()) {
            TestTell(suite, test, totals[test]);
        }
    }
    close(fds[0]);
    while (wait(nullptr) > 0) {
    }
    for (size_t test = 0; test < totals.size(); test++) {
        if (IsWanted(suite, test) && totals[test].reports < VerdictWorkers()) {
            TestTell(suite, test, totals[test]);
        }
    }
    TotalsTell(suite, totals);
}

bool SeedsTake(int argc, char *argv[], SEEDS &seeds)
{
    string szFilter;
    if (!OptionsTake(
            argc, argv,
            {{"--machines", &seeds.machines}, {"--seed", &seeds.first}, {"", &szFilter}})) {
        return false;
    }
    if (szFilter.empty()) {
        return true;
    }
    seeds.machines = 1;
    const size_t cbPrefix = szFilter.starts_with(SEED_OF) ? strlen(SEED_OF) : 0;
    return NumberTake(szFilter.c_str() + cbPrefix, seeds.first);
}

void SeedsRun(const SEEDS &seeds, const std::function<std::string(std::uint64_t seed)> &wrongOf)
{
    SUITE suite = {.szDone = "", .work = [&](size_t test, size_t worker) {
                       TALLY tally;
                       const string szWrong =
                           test % VerdictWorkers() == worker ? wrongOf(seeds.first + test) : "";
                       if (!szWrong.empty()) {
                           tally.wrong.push_back(szWrong);
                       }
                       return tally;
                   }};
    for (std::uint64_t i = 0; i < seeds.machines; i++) {
        suite.names.push_back(SEED_OF + to_string(seeds.first + i));
    }
    SuiteRun(suite);
}
