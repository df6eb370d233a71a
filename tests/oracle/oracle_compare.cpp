// SPDX-License-Identifier: MIT
#include "oracle_compare.h"

#include "words.h"

#include <algorithm>
#include <cctype>

namespace
{

using std::string;
using std::to_string;
using std::vector;
using TEXTS = vector<string>;

string LineText(int priority, const string &szLine)
{
    return "<" + to_string(priority) + "> " + szLine;
}

// The disk whose child runs the command; empty for what the parent runs among its children.
string CommandDisk(const ORACLE_WORDS &words)
{
    if (words.size() > 1 && words[1] == "--zero-superblock") {
        return "";
    }
    string name = words.back();
    name = name.compare(0, 5, "/dev/") == 0 ? name.substr(5) : name;
    while (!name.empty() && isdigit(static_cast<unsigned char>(name.back())) != 0) {
        name.pop_back();
    }
    return name;
}

// The model's answer in terms of what can be seen: each pause and each text for the shell becomes
// the command that is recorded, and what the shell cannot find goes.
void ActionsAsSeen(vector<ORACLE_ACTION> &actions, bool fShellText)
{
    if (!fShellText) {
        std::erase_if(actions, [](const ORACLE_ACTION &action) { return action.fMissing; });
    }
    for (ORACLE_ACTION &action : actions) {
        if (action.kind == ORACLE_KIND::SLEEP) {
            action.words = {"sleep", to_string(action.nNumber)};
            action.kind = ORACLE_KIND::COMMAND;
        } else if (action.kind == ORACLE_KIND::SHELL) {
            action.words = fShellText ? ORACLE_WORDS{"sh", "-c", action.szText} : action.words;
            action.kind = ORACLE_KIND::COMMAND;
        }
    }
}

ORACLE_ANSWER AnswerAsSeen(ORACLE_ANSWER answer, bool fShellText)
{
    for (ORACLE_PHASE &phase : answer.phases) {
        for (ORACLE_STRAND &strand : phase) {
            ActionsAsSeen(strand.actions, fShellText);
        }
    }
    return answer;
}

// A shell that is a stand-in only answers.
string ErrorText(const ORACLE_ANSWER &answer, bool fShellText)
{
    string text;
    for (const ORACLE_PHASE &phase : answer.phases) {
        for (const ORACLE_STRAND &strand : phase) {
            for (const ORACLE_ACTION &action : strand.actions) {
                text += fShellText ? "" : action.szErr;
            }
        }
    }
    return text;
}

bool IsCommand(const ORACLE_ACTION &action)
{
    return action.kind == ORACLE_KIND::COMMAND;
}

string ActionText(const ORACLE_ACTION &action)
{
    return action.kind == ORACLE_KIND::LOG ? LineText(action.nNumber, action.szText)
           : IsCommand(action)             ? WordsText(action.words)
                                           : action.szText;
}

template <typename TEST>
TEXTS ActionTexts(const ORACLE_STRAND &strand, TEST wanted)
{
    TEXTS texts;
    for (const ORACLE_ACTION &action : strand.actions) {
        if (wanted(action)) {
            texts.push_back(ActionText(action));
        }
    }
    return texts;
}

bool IsLog(const ORACLE_ACTION &action)
{
    return action.kind == ORACLE_KIND::LOG;
}

bool IsErrorLog(const ORACLE_ACTION &action)
{
    return action.kind == ORACLE_KIND::ERROR_LOG;
}

void ListCompare(const string &szWhat, const TEXTS &expected, const TEXTS &seen, TEXTS &differences)
{
    if (expected == seen) {
        return;
    }
    string text = szWhat + "\n";
    const size_t same = static_cast<size_t>(
        std::mismatch(expected.begin(), expected.end(), seen.begin(), seen.end()).first -
        expected.begin());
    for (size_t i = 0; i < same; i++) {
        text += "      both: " + expected[i] + "\n";
    }
    for (size_t i = same; i < expected.size(); i++) {
        text += "  expected: " + expected[i] + "\n";
    }
    for (size_t i = same; i < seen.size(); i++) {
        text += "      seen: " + seen[i] + "\n";
    }
    differences.push_back(text);
}

void BagCompare(const string &szWhat, TEXTS expected, TEXTS seen, TEXTS &differences)
{
    std::sort(expected.begin(), expected.end());
    std::sort(seen.begin(), seen.end());
    TEXTS missing;
    TEXTS extra;
    std::set_difference(expected.begin(), expected.end(), seen.begin(), seen.end(),
                        std::back_inserter(missing));
    std::set_difference(seen.begin(), seen.end(), expected.begin(), expected.end(),
                        std::back_inserter(extra));
    ListCompare(szWhat, missing, extra, differences);
}

// The next `count` of the seen texts, fewer when there are not so many; all of them at last.
template <typename T>
vector<T> SliceTake(const vector<T> &all, size_t &at, size_t count, bool fLast)
{
    const size_t end = fLast ? all.size() : std::min(all.size(), at + count);
    const vector<T> slice(all.begin() + static_cast<std::ptrdiff_t>(at),
                          all.begin() + static_cast<std::ptrdiff_t>(end));
    at = end;
    return slice;
}

// The parent takes the disks one after the other: it works on a disk only when the children of that
// disk and of those before it have ended.
void PatienceCompare(const string &szPhase, const ORACLE_PHASE &phase,
                     const vector<ORACLE_WORDS> &seen, TEXTS &differences)
{
    std::map<string, size_t> places;
    for (size_t i = 0; i + 1 < phase.size(); i++) {
        places[phase[i].szDisk] = i;
    }
    size_t patience = 0;
    for (const ORACLE_WORDS &words : seen) {
        const string szDisk = CommandDisk(words);
        if (szDisk.empty()) {
            patience = std::max(patience, 1 + places[CommandDisk({words.back()})]);
        } else if (places.count(szDisk) != 0 && places[szDisk] < patience) {
            differences.push_back(
                szPhase +
                ": not waited for before a later disk was dealt with: " + WordsText(words) + "\n");
        }
    }
}

void PhaseCompare(const string &szPhase, const ORACLE_PHASE &phase,
                  const vector<ORACLE_WORDS> &seen, TEXTS &differences)
{
    std::map<string, TEXTS> bySeen;
    for (const ORACLE_WORDS &words : seen) {
        bySeen[phase.size() == 1 ? "" : CommandDisk(words)].push_back(WordsText(words));
    }
    for (const ORACLE_STRAND &strand : phase) {
        const string szWho = strand.szDisk.empty() ? "the parent" : strand.szDisk;
        ListCompare(szPhase + ": commands of " + szWho, ActionTexts(strand, IsCommand),
                    bySeen[strand.szDisk], differences);
        bySeen.erase(strand.szDisk);
    }
    for (const auto &[szDisk, texts] : bySeen) {
        ListCompare(szPhase + ": commands of " + szDisk, {}, texts, differences);
    }
    PatienceCompare(szPhase, phase, seen, differences);
}

template <typename TEST>
TEXTS PhaseTexts(const ORACLE_PHASE &phase, TEST wanted)
{
    TEXTS texts;
    for (const ORACLE_STRAND &strand : phase) {
        const TEXTS own = ActionTexts(strand, wanted);
        texts.insert(texts.end(), own.begin(), own.end());
    }
    return texts;
}

// The lines of one process come in its order, whoever else writes in between.
void OrderCompare(const string &szWhat, const ORACLE_PHASE &phase, const TEXTS &seen,
                  TEXTS &differences)
{
    for (const ORACLE_STRAND &strand : phase) {
        auto at = seen.begin();
        for (const string &szLine : ActionTexts(strand, IsLog)) {
            at = std::find(at, seen.end(), szLine);
            if (at == seen.end()) {
                differences.push_back(szWhat + " of " + strand.szDisk +
                                      ": not in its place: " + szLine + "\n");
                break;
            }
            ++at;
        }
    }
}

void CommandsCompare(const ORACLE_ANSWER &answer, const ORACLE_SEEN &seen, TEXTS &differences)
{
    size_t at = 0;
    for (size_t i = 0; i < answer.phases.size(); i++) {
        const size_t count = PhaseTexts(answer.phases[i], IsCommand).size();
        PhaseCompare("phase " + to_string(i), answer.phases[i],
                     SliceTake(seen.commands, at, count, i + 1 == answer.phases.size()),
                     differences);
    }
}

void LinesCompare(const ORACLE_ANSWER &answer, const ORACLE_SEEN &seen, TEXTS &differences)
{
    TEXTS lines;
    for (const auto &[priority, szLine] : seen.lines) {
        lines.push_back(LineText(priority, OracleLineMask(szLine)));
    }
    size_t at = 0;
    for (size_t i = 0; i < answer.phases.size(); i++) {
        const TEXTS expected = PhaseTexts(answer.phases[i], IsLog);
        const TEXTS own = SliceTake(lines, at, expected.size(), i + 1 == answer.phases.size());
        const string szWhat = "phase " + to_string(i) + ": syslog";
        if (answer.phases[i].size() == 1) {
            ListCompare(szWhat, expected, own, differences);
        } else {
            BagCompare(szWhat, expected, own, differences);
            OrderCompare(szWhat, answer.phases[i], own, differences);
        }
    }
}

void ErrorLogCompare(const ORACLE_ANSWER &answer, const ORACLE_SEEN &seen, TEXTS &differences)
{
    TEXTS expected;
    for (const ORACLE_PHASE &phase : answer.phases) {
        const TEXTS own = PhaseTexts(phase, IsErrorLog);
        expected.insert(expected.end(), own.begin(), own.end());
    }
    BagCompare(ORACLE_ERROR_LOG_PATH, expected, seen.errorLog, differences);
}

TEXTS AnswerCompare(const ORACLE_ANSWER &answer, const ORACLE_SEEN &seen)
{
    const ORACLE_ANSWER expected = AnswerAsSeen(answer, seen.fShellText);
    TEXTS differences;
    ListCompare("standard output", {expected.szOut}, {seen.szOut}, differences);
    ListCompare("standard error", {ErrorText(answer, seen.fShellText)}, {seen.szErr}, differences);
    ListCompare("exit status", {to_string(expected.nStatus)}, {to_string(seen.nStatus)},
                differences);
    ListCompare("marker files", TEXTS(expected.markers.begin(), expected.markers.end()),
                TEXTS(seen.markers.begin(), seen.markers.end()), differences);
    CommandsCompare(expected, seen, differences);
    LinesCompare(expected, seen, differences);
    ErrorLogCompare(expected, seen, differences);
    ListCompare("problems", {}, seen.problems, differences);
    return differences;
}

} // namespace

std::vector<ORACLE_ANSWER> OracleAnswers(ORACLE_MACHINE machine, const ORACLE_WORDS &words)
{
    vector<ORACLE_ANSWER> answers;
    vector<string> &members = machine.md0Members;
    std::sort(members.begin(), members.end());
    do {
        answers.push_back(OracleAnswer(machine, words));
    } while (std::next_permutation(members.begin(), members.end()));
    return answers;
}

std::vector<std::string> OracleDifferences(const std::vector<ORACLE_ANSWER> &answers,
                                           const ORACLE_SEEN &seen)
{
    TEXTS nearest = AnswerCompare(answers[0], seen);
    for (const ORACLE_ANSWER &answer : answers) {
        const TEXTS differences = AnswerCompare(answer, seen);
        nearest = differences.size() < nearest.size() ? differences : nearest;
    }
    return nearest;
}
