// SPDX-License-Identifier: MIT
#include "judge.h"

#include "allowances.h"
#include "pattern.h"

#include <algorithm>
#include <csignal>
#include <set>

namespace
{

using STRINGS = std::vector<std::string>;
using std::string;

string WordsJoin(const STRINGS &words)
{
    string szText;
    for (const string &szWord : words) {
        szText += (szText.empty() ? "" : " ") + (szWord.empty() ? "\"\"" : szWord);
    }
    return szText;
}

STRINGS FaultsOf(const RUN_RESULT &result)
{
    STRINGS faults;
    for (const RUN_EVENT &event : result.events) {
        if (event.kind == EVENT_KIND::FAULT) {
            faults.push_back(WordsJoin({event.argv.begin() + 1, event.argv.end()}));
        }
    }
    return faults;
}

// What is compared of a run.
struct SUBJECT {
    const string &szSituation;
    const STRINGS &words;
    const RUN_RESULT &clean;
    const RUN_RESULT &result;
    STRINGS faults;
    VERDICT verdict;
};

void Differs(SUBJECT &subject, DIFFERENCE difference, const string &szText, const string &szWrong)
{
    for (size_t row = 0; row < std::size(ALLOWANCES); row++) {
        const ALLOWANCE &allowance = ALLOWANCES[row];
        if (allowance.difference == difference &&
            PatternMatches(subject.szSituation, allowance.szSituation) &&
            PatternMatches(szText, allowance.szText) &&
            std::any_of(subject.faults.begin(), subject.faults.end(), [&](const string &szFault) {
                return PatternMatches(szFault, allowance.szFault);
            })) {
            subject.verdict.allowed[row]++;
            return;
        }
    }
    subject.verdict.wrong.push_back(szWrong + (szText.empty() ? "" : ": " + szText));
}

// ---- how it ends -------------------------------------------------------------------------------

void JudgeEnd(SUBJECT &subject)
{
    const RUN_RESULT &result = subject.result;
    STRINGS &wrong = subject.verdict.wrong;
    if (result.fTimedOut) {
        wrong.emplace_back("it hangs");
    } else if (result.signal == SIGABRT) {
        Differs(subject, DIFFERENCE::ABORT, result.szErr, "it aborts");
    } else if (result.signal != 0) {
        wrong.push_back("it ends by signal " + std::to_string(result.signal));
    } else if (result.status < 0) {
        wrong.emplace_back("the sandbox itself broke down");
    } else if (!result.szErr.empty()) {
        Differs(subject, DIFFERENCE::ABORT, result.szErr, "it writes to standard error");
    }
    if (result.nUnreaped + result.nRunning > 0) {
        Differs(subject, DIFFERENCE::LEFT_CHILDREN, "",
                "it leaves " + std::to_string(result.nUnreaped) + " children unreaped and " +
                    std::to_string(result.nRunning) + " running");
    }
}

// ---- what it runs ------------------------------------------------------------------------------

bool IsQuery(const RUN_EVENT &event)
{
    static const std::set<string> QUESTIONS = {"-E", "-l", "-o"};
    return event.argv.size() > 1 && QUESTIONS.contains(event.argv[1]);
}

// The disks and devices that a command names; a partition is its disk.
std::set<string> DisksOf(const RUN_EVENT &event)
{
    std::set<string> disks;
    for (const string &szWord : event.argv) {
        if (szWord.starts_with("/dev/")) {
            const size_t cch = szWord.starts_with("/dev/sd")
                                   ? szWord.find_last_not_of("0123456789") + 1
                                   : szWord.size();
            disks.insert(szWord.substr(0, cch));
        }
    }
    return disks;
}

// What a run may do, taken from the undisturbed one.
struct EXPECTED {
    std::map<string, int> commands = {};
    std::set<string> changed = {};
};

EXPECTED ExpectedOf(const RUN_RESULT &clean)
{
    EXPECTED expected;
    for (const RUN_EVENT &event : clean.events) {
        if (event.kind == EVENT_KIND::COMMAND) {
            expected.commands[WordsJoin(event.argv)]++;
        }
        if (event.kind == EVENT_KIND::COMMAND && !IsQuery(event)) {
            expected.changed.merge(DisksOf(event));
        }
    }
    return expected;
}

DIFFERENCE DifferenceOf(const EXPECTED &expected, const RUN_EVENT &event)
{
    if (IsQuery(event)) {
        return DIFFERENCE::EXTRA_QUERY;
    }
    const std::set<string> disks = DisksOf(event);
    return std::includes(expected.changed.begin(), expected.changed.end(), disks.begin(),
                         disks.end())
               ? DIFFERENCE::EXTRA_CHANGE
               : DIFFERENCE::OTHER_DISK;
}

void JudgeCommands(SUBJECT &subject)
{
    EXPECTED expected = ExpectedOf(subject.clean);
    for (const RUN_EVENT &event : subject.result.events) {
        if (event.kind != EVENT_KIND::COMMAND) {
            continue;
        }
        const string szCommand = WordsJoin(event.argv);
        if (event.nDescriptors > 0) {
            subject.verdict.wrong.push_back("descriptors are left to " + szCommand);
        }
        if (--expected.commands[szCommand] < 0) {
            const DIFFERENCE difference = DifferenceOf(expected, event);
            Differs(subject, difference, szCommand,
                    difference == DIFFERENCE::OTHER_DISK ? "it changes another disk"
                                                         : "it runs what it should not");
        }
    }
}

// ---- what it says ------------------------------------------------------------------------------

STRINGS LinesOf(const string &szText)
{
    STRINGS lines;
    for (size_t iStart = 0; iStart < szText.size();) {
        const size_t iEnd = std::min(szText.find('\n', iStart), szText.size() - 1) + 1;
        lines.push_back(szText.substr(iStart, iEnd - iStart));
        iStart = iEnd;
    }
    return lines;
}

bool IsSubsequence(const STRINGS &part, const STRINGS &whole)
{
    size_t i = 0;
    for (const string &szOne : whole) {
        i += i < part.size() && part[i] == szOne ? 1 : 0;
    }
    return i == part.size();
}

bool SaysLike(const RUN_RESULT &result, int status, const string &szOut)
{
    return result.status == status && result.szOut == szOut;
}

// A stream that takes nothing loses words; the work and the exit status are not changed by that.
bool WordsWereLost(const SUBJECT &subject)
{
    return std::any_of(subject.faults.begin(), subject.faults.end(), [](const string &szFault) {
        return szFault.starts_with("puts ") || szFault.starts_with("printf ");
    });
}

string MembersDropped(const string &szReport)
{
    string szText;
    for (const string &szLine : LinesOf(szReport)) {
        szText += szLine.starts_with("\t [") ? "" : szLine;
    }
    return szText;
}

// Either the report or that there is no such array. In between there are only reports without a
// member that could not be read, and they are counted.
bool StatusSaysRight(SUBJECT &subject)
{
    const RUN_RESULT &result = subject.result;
    const string szMd = subject.words.size() > 1 ? "/dev/md" + subject.words[1] : "";
    if (SaysLike(result, 1, "RAID " + szMd + " is not found\n")) {
        return true;
    }
    if (result.status != 0 || subject.clean.status != 0 ||
        MembersDropped(result.szOut) != MembersDropped(subject.clean.szOut) ||
        !IsSubsequence(LinesOf(result.szOut), LinesOf(subject.clean.szOut))) {
        return false;
    }
    Differs(subject, DIFFERENCE::ANSWER, "\n" + result.szOut, "it reports fewer members");
    return true;
}

// Always 0, and at most two lines.
bool DestroySaysRight(SUBJECT &subject)
{
    const string szMd = subject.words.size() > 1 ? "/dev/md" + subject.words[1] : "";
    return subject.result.status == 0 &&
           IsSubsequence(LinesOf(subject.result.szOut),
                         {"Found LVM on " + szMd + ", remove it \n", "Not found " + szMd + " \n"});
}

bool NewvolSaysRight(SUBJECT &subject)
{
    const RUN_RESULT &result = subject.result;
    if (SaysLike(result, 1, "") || SaysLike(result, 1, "No disk to create RAID... \n")) {
        return true;
    }
    if (!PatternMatches(result.szOut, "^Creating RAID [015] volume\\.\\.\\. \n$") ||
        result.status > 1) {
        return false;
    }
    if (result.szOut != subject.clean.szOut) {
        Differs(subject, DIFFERENCE::ANSWER, result.szOut, "it makes another array");
    }
    return true;
}

bool InitsysSaysRight(SUBJECT &subject)
{
    static const std::set<string> DUPLICATION = {"", "can not fork to nurodd\n",
                                                 "system init with nurodd failed\n"};
    const bool fDuplicates = subject.words[0] == "initsys-dd";
    return subject.result.status >= 0 && subject.result.status <= 1 &&
           DUPLICATION.contains(subject.result.szOut) &&
           (fDuplicates || subject.result.szOut.empty());
}

// As many numbers as the status says; or a failure, which says nothing.
bool EnumerationSaysRight(SUBJECT &subject)
{
    constexpr int STATUS_LIST_FAILED = 255;
    const RUN_RESULT &result = subject.result;
    if (SaysLike(result, 1, "") || SaysLike(result, STATUS_LIST_FAILED, "")) {
        return true;
    }
    const bool fAll = result.szOut == "all" && result.status > 0 &&
                      subject.words[0] == "enumformatalldisks_indualhead_install";
    const auto nNumber = std::count(result.szOut.begin(), result.szOut.end(), ' ');
    if (!fAll && (!PatternMatches(result.szOut, "^([0-9]+ )*$") || nNumber != result.status)) {
        return false;
    }
    Differs(subject, DIFFERENCE::ANSWER, "[" + result.szOut + "]", "it lists other disks");
    return true;
}

bool SaysRight(SUBJECT &subject)
{
    const string szWord = subject.words.empty() ? "" : subject.words[0];
    const bool fUsage = subject.clean.szOut.find("usage:\n") != string::npos;
    if (subject.result.szOut == subject.clean.szOut &&
        subject.result.status == subject.clean.status) {
        return true;
    }
    if (WordsWereLost(subject) &&
        (subject.result.status == subject.clean.status || subject.result.szOut.empty())) {
        return IsSubsequence(LinesOf(subject.result.szOut), LinesOf(subject.clean.szOut));
    }
    if (fUsage) {
        return false;
    }
    if (szWord == "status") {
        return StatusSaysRight(subject);
    }
    if (szWord == "destroy") {
        return DestroySaysRight(subject);
    }
    if (szWord == "newvol") {
        return NewvolSaysRight(subject);
    }
    if (szWord.starts_with("initsys")) {
        return InitsysSaysRight(subject);
    }
    return szWord.starts_with("enum") && EnumerationSaysRight(subject);
}

void JudgeWords(SUBJECT &subject)
{
    if (!SaysRight(subject)) {
        subject.verdict.wrong.push_back("it ends with status " +
                                        std::to_string(subject.result.status) + " and says [" +
                                        subject.result.szOut + "]");
    }
}

} // namespace

VERDICT Judge(const SITUATION &situation, const RUN_RESULT &clean, const RUN_RESULT &result)
{
    SUBJECT subject = {situation.szName, situation.words, clean, result, FaultsOf(result), {}};
    JudgeEnd(subject);
    JudgeCommands(subject);
    if (result.status >= 0 && result.szErr.empty()) {
        JudgeWords(subject);
    }
    return subject.verdict;
}

bool WasInjected(const RUN_RESULT &result)
{
    return std::any_of(result.events.begin(), result.events.end(),
                       [](const RUN_EVENT &event) { return event.kind == EVENT_KIND::FAULT; });
}

string FaultText(const RUN_RESULT &result)
{
    constexpr size_t SHOWN = 6;
    const STRINGS faults = FaultsOf(result);
    string szText;
    for (size_t i = 0; i < std::min(faults.size(), SHOWN); i++) {
        szText += "    failed: " + faults[i] + "\n";
    }
    return faults.size() > SHOWN
               ? szText + "    and " + std::to_string(faults.size() - SHOWN) + " more\n"
               : szText;
}

size_t AllowanceCount()
{
    return std::size(ALLOWANCES);
}

string AllowanceText(size_t row)
{
    return ALLOWANCES[row].szReason;
}
