// SPDX-License-Identifier: MIT
#include "suite.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <sstream>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

constexpr size_t WRONG_SHOWN = 5; // of one worker in one test
constexpr size_t REPORT_SIZE = 65536;

using std::string;
using std::to_string;

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

// ---- workers -----------------------------------------------------------------------------------

// One packet: test, count and number of what was wrong; then a line for every reason.
void TallySend(int fd, size_t test, const TALLY &tally)
{
    string szReport =
        to_string(test) + " " + to_string(tally.done) + " " + to_string(tally.wrong.size()) + "\n";
    for (const auto &[szReason, n] : tally.allowed) {
        szReport += to_string(n) + " " + szReason + "\n";
    }
    if (send(fd, szReport.data(), szReport.size(), 0) < 0) {
        exit(EXIT_FAILURE);
    }
}

void WrongTell(const TALLY &tally)
{
    const size_t nShown = std::min(tally.wrong.size(), WRONG_SHOWN);
    for (size_t i = 0; i < nShown; i++) {
        (void)fputs(tally.wrong[i].c_str(), stdout);
    }
    if (nShown < tally.wrong.size()) {
        printf("and %zu more\n", tally.wrong.size() - nShown);
    }
    (void)fflush(stdout);
}

void WorkerStart(const SUITE &suite, size_t worker, const int (&fds)[2])
{
    if (fork() != 0) {
        return;
    }
    close(fds[0]);
    for (size_t test = 0; test < suite.names.size(); test++) {
        const TALLY tally = suite.work(test, worker);
        WrongTell(tally);
        TallySend(fds[1], test, tally);
    }
    exit(EXIT_SUCCESS);
}

size_t ReportTake(const string &szReport, std::vector<TEST_TOTAL> &totals)
{
    std::istringstream lines(szReport);
    size_t test = 0;
    std::uint64_t done = 0;
    std::uint64_t n = 0;
    lines >> test >> done >> n;
    TEST_TOTAL &total = totals[test];
    total.reports++;
    total.done += done;
    total.wrong += n;
    string szReason;
    while (lines >> n && lines.get() && std::getline(lines, szReason)) {
        total.allowed[szReason] += n;
    }
    return test;
}

void TestTell(const SUITE &suite, size_t test, const TEST_TOTAL &total, COUNTS &counts)
{
    const bool fPassed = total.reports == suite.nWorker && total.wrong == 0;
    const string &szName = suite.names[test];
    VerdictTell(counts, fPassed, szName + ": " + to_string(total.done) + " " + suite.szDone);
    if (total.reports < suite.nWorker) {
        printf("  a worker broke down\n");
    }
    if (!fPassed && *suite.szAgain != '\0') {
        printf("  again with: %s '%s'\n", suite.szAgain, szName.c_str());
    }
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
        const auto option = std::find_if(options.begin(), options.end(), [&](const OPTION &one) {
            return string(one.szName) == argv[i];
        });
        if (option != options.end() && option->pTo.index() == 0) {
            *std::get<bool *>(option->pTo) = true;
        } else if (option == options.end() || i + 1 == argc || !OptionTake(*option, argv[++i])) {
            UsageTell(options);
            return false;
        }
    }
    return true;
}

void VerdictTell(COUNTS &counts, bool fPassed, const std::string &szName)
{
    (fPassed ? counts.passed : counts.failed)++;
    printf("%s %s\n", fPassed ? "ok" : "FAILED", szName.c_str());
    (void)fflush(stdout);
}

std::vector<TEST_TOTAL> SuiteRun(const SUITE &suite, COUNTS &counts)
{
    int fds[2] = {-1, -1};
    if (socketpair(AF_UNIX, SOCK_SEQPACKET, 0, fds) != 0) {
        perror("workers");
        exit(EXIT_FAILURE);
    }
    (void)fflush(nullptr);
    for (size_t worker = 0; worker < suite.nWorker; worker++) {
        WorkerStart(suite, worker, fds);
    }
    close(fds[1]);
    std::vector<TEST_TOTAL> totals(suite.names.size());
    string szReport(REPORT_SIZE, '\0');
    for (ssize_t cb = 0; (cb = recv(fds[0], szReport.data(), szReport.size(), 0)) > 0;) {
        const size_t test = ReportTake(szReport.substr(0, static_cast<size_t>(cb)), totals);
        if (totals[test].reports == suite.nWorker) {
            TestTell(suite, test, totals[test], counts);
        }
    }
    close(fds[0]);
    while (wait(nullptr) > 0) {
    }
    for (size_t test = 0; test < totals.size(); test++) {
        if (totals[test].reports < suite.nWorker) {
            TestTell(suite, test, totals[test], counts);
        }
    }
    return totals;
}

int CountsTell(const COUNTS &counts)
{
    printf("%llu passed, %llu failed\n", static_cast<unsigned long long>(counts.passed),
           static_cast<unsigned long long>(counts.failed));
    return counts.failed == 0 && counts.passed > 0 ? EXIT_SUCCESS : EXIT_FAILURE;
}
