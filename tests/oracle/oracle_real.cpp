// SPDX-License-Identifier: MIT
//
// Random machines with real disks: prints what the appliance must set up, and compares what was
// recorded there with the model.
//
//     oracle_real plan SEED N [rehearsed]             the script of N machines, the first from SEED
//     oracle_real compare SEED N FOLDER [rehearsed]   their records
//
// Rehearsed, the commands of a rehearsal must be those that the tool ran afterwards. Where one of
// these failed, which no rehearsal can know, it must have warned.
#include "oracle_compare.h"
#include "oracle_plan.h"
#include "oracle_strands.h"
#include "suite.h"
#include "verdict.h"
#include "words.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <regex>

namespace
{

using std::optional;
using std::string;
using std::to_string;
using std::vector;
using u64 = std::uint64_t;

// What the appliance saw of one machine.
struct RECORD {
    ORACLE_MACHINE machine{};
    ORACLE_SEEN seen{};
    string szFailed{}; // the first command that did, and its status
};

// A file of a record that must be there.
string PartRead(const string &szFolder, const string &szPart, ORACLE_SEEN &seen)
{
    const optional<string> szText = FileText(szFolder + "/" + szPart);
    if (!szText) {
        seen.problems.push_back("no record of " + szPart);
    }
    return szText.value_or("");
}

void MachineTake(const string &szFolder, RECORD &record)
{
    record.machine.disks.clear();
    record.machine.md0Members.clear();
    for (const string &szLine : SplitLines(PartRead(szFolder, "machine", record.seen))) {
        const vector<string> words = Split(szLine, ' ');
        if (words[0] == "disk") {
            record.machine.disks[words[1]];
        } else if (words[0] == "partition") {
            record.machine.disks[words[1]][atoi(words[2].c_str())] = {words[3] + "\n",
                                                                      words[4] + "\n"};
        } else if (words[0] == "host") {
            record.machine.hosts.try_emplace(words[1]); // what it says is in the plan
        } else {
            record.machine.md0Members.push_back(words[1]);
        }
    }
}

// What a tool answered is what the model is told that it answers.
void ReplyTake(const string &szFolder, const string &szReply, const ORACLE_WORDS &words,
               RECORD &record)
{
    ORACLE_REPLY reply;
    reply.szOut = PartRead(szFolder, szReply + ".out", record.seen);
    reply.szErr = PartRead(szFolder, szReply + ".err", record.seen);
    reply.nExit = atoi(PartRead(szFolder, szReply + ".status", record.seen).c_str());
    record.machine.replies[OracleReplyKey(words)].push_back(reply);
    if (reply.nExit != 0 && !OracleIsQuestion(words) && record.szFailed.empty()) {
        record.szFailed = OracleReplyKey(words) + ", status " + to_string(reply.nExit);
    }
}

// Lines of a number and an argument list, or of a pause that was answered.
void CallsTake(const string &szFolder, RECORD &record)
{
    static const std::regex pause(R"(^clock_nanosleep\(.*\{tv_sec=([0-9]+), tv_nsec=0\}.*\) = 0)");
    for (string szLine : SplitLines(PartRead(szFolder, "calls", record.seen))) {
        szLine.erase(0, szLine.find_first_not_of('\037'));
        std::smatch match;
        if (std::regex_search(szLine, match, pause)) {
            record.seen.commands.push_back({"sleep", match[1]});
            continue;
        }
        ORACLE_WORDS words = Split(szLine, '\037');
        words.pop_back(); // every word ends with the separator
        if (words.size() > 1) {
            const string szReply = "reply." + words[0];
            words.erase(words.begin());
            record.seen.commands.push_back(words);
            ReplyTake(szFolder, szReply, words, record);
        } else if (!szLine.empty() && szLine.find("+++ exited with") == string::npos) {
            record.seen.problems.push_back("recorded among the calls: " + szLine);
        }
    }
}

void LogTake(const string &szFolder, ORACLE_SEEN &seen)
{
    static const std::map<string, int> priorities = {{"emerg", 0}, {"alert", 1}, {"crit", 2},
                                                     {"err", 3},   {"warn", 4},  {"notice", 5},
                                                     {"info", 6},  {"debug", 7}};
    static const std::regex own("^.{15} [^ ]+ user\\.([a-z]+) arrayctl: (.*)$");
    for (const string &szLine : SplitLines(PartRead(szFolder, "log", seen))) {
        std::smatch match;
        if (std::regex_match(szLine, match, own)) {
            seen.lines.emplace_back(priorities.at(match[1]), match[2]);
        } else if (szLine.find("arrayctl") != string::npos) {
            seen.problems.push_back("in the system log: " + szLine);
        }
    }
}

void ErrorLogTake(const string &szFolder, ORACLE_SEEN &seen)
{
    for (const string &szLine : SplitLines(FileText(szFolder + "/errors").value_or(""))) {
        seen.errorLog.push_back(OracleErrorLineMask(szLine));
    }
}

RECORD RecordTake(const PLAN &plan, const string &szFolder)
{
    RECORD record;
    record.machine = plan.subject.machine;
    if (!plan.fUnits) {
        record.machine.hosts.clear(); // the appliance's own adapters say nothing
    }
    MachineTake(szFolder, record);
    CallsTake(szFolder, record);
    LogTake(szFolder, record.seen);
    ErrorLogTake(szFolder, record.seen);
    record.seen.szOut = PartRead(szFolder, "out", record.seen);
    record.seen.szErr = PartRead(szFolder, "err", record.seen);
    record.seen.nStatus = atoi(PartRead(szFolder, "status", record.seen).c_str());
    for (const string &szMarker : SplitLines(PartRead(szFolder, "markers", record.seen))) {
        record.seen.markers.insert(szMarker);
    }
    return record;
}

// --------------------------------------------------------------------------------- the verdict

// A machine that was not set up as planned proves nothing.
void SetUpCheck(const PLAN &plan, const RECORD &record, vector<string> &differences)
{
    string planned;
    for (const auto &[szName, disk] : plan.disks) {
        planned += szName;
        for (const PLAN_PARTITION &partition : disk.table) {
            // The kernel shows only the head of an extended partition.
            const u64 size = partition.number == 4 ? 2 : partition.size;
            planned += " " + to_string(partition.number) + ":" + to_string(partition.start) + "+" +
                       to_string(size);
        }
        planned += "\n";
    }
    string made;
    for (const auto &[szName, table] : record.machine.disks) {
        made += szName;
        for (const auto &[number, partition] : table) {
            made += " " + to_string(number) + ":" + to_string(atoll(partition.szStart->c_str())) +
                    "+" + to_string(atoll(partition.szSize->c_str()));
        }
        made += "\n";
    }
    vector<string> wanted = plan.subject.machine.md0Members;
    vector<string> running = record.machine.md0Members;
    std::sort(wanted.begin(), wanted.end());
    std::sort(running.begin(), running.end());
    if (planned != made || wanted != running) {
        differences.push_back("the machine itself, planned\n" + planned + "made\n" + made);
    }
}

string Head(const PLAN &plan, const RECORD &record)
{
    string text;
    for (const string &szWord : plan.subject.words) {
        text += szWord + " ";
    }
    return text + "on " + to_string(plan.disks.size()) + " disks, " +
           to_string(plan.arrays.size()) + " arrays, " + to_string(record.seen.commands.size()) +
           " calls, status " + to_string(record.seen.nStatus);
}

// So many machines have to be compared with what was rehearsed on them.
constexpr u64 COMPARED_MIN = 60;
constexpr char COMPARED[] = "enough machines on which no command failed";
constexpr std::pair<const char *, u64> COMMANDS_MIN[] = {
    {"initsys", 6}, {"initsys-dd", 4}, {"newvol", 10}, {"enumformatalldisks", 6}, {"destroy", 12},
};

constexpr int STATUS_CLEAN = 0;
constexpr int STATUS_WARNED = 3;

void RehearsalCompare(const string &szFolder, RECORD &record, vector<string> &differences)
{
    const string szTold = PartRead(szFolder, "rehearsed", record.seen);
    const int nStatus = atoi(PartRead(szFolder, "rehearsed.status", record.seen).c_str());
    if (!record.szFailed.empty()) {
        if (nStatus != STATUS_WARNED) {
            differences.push_back(
                "the rehearsal: it did not warn, and this failed: " + record.szFailed + "\n");
        }
        return;
    }
    const string szDifference = OracleStrandsDifference(OracleStrandsRehearsed(szTold),
                                                        OracleStrandsRun(record.seen.commands));
    if ((nStatus != STATUS_CLEAN && nStatus != STATUS_WARNED) || !szDifference.empty()) {
        differences.push_back("the rehearsal, of status " + to_string(nStatus) + "\n" +
                              PartRead(szFolder, "rehearsed.errors", record.seen) + szDifference);
    }
}

// Whether the array that is to be taken apart runs.
bool HasArray(const PLAN &plan)
{
    return PlanDestroys(plan) &&
           std::any_of(plan.arrays.begin(), plan.arrays.end(), [&](const PLAN_ARRAY &array) {
               return array.fRunning && to_string(array.nMd) == plan.subject.words[1];
           });
}

// A run that was to take an array apart has to have come so far as to stop it.
void DestroyCompare(const PLAN &plan, const RECORD &record, vector<string> &differences)
{
    const ORACLE_WORDS stop = {ORACLE_MDADM, "-S", "/dev/md" + plan.subject.words[1]};
    const auto &commands = record.seen.commands;
    const bool fStopped = std::find(commands.begin(), commands.end(), stop) != commands.end();
    if (HasArray(plan) != fStopped) {
        differences.push_back(string("what was done to the array: it was ") +
                              (fStopped ? "stopped, and did not run\n" : "not stopped\n"));
    }
    for (const string &szProblem : record.seen.problems) {
        differences.push_back("problems: " + szProblem + "\n");
    }
}

void ModelCompare(const ORACLE_CASE &subject, const RECORD &record, vector<string> &differences)
{
    const vector<string> others =
        OracleDifferences(OracleAnswers(subject.machine, subject.words), record.seen);
    differences.insert(differences.end(), others.begin(), others.end());
}

// What the machine proves: its command when nothing of that failed or differed, else an empty text.
string MachineCompare(u64 seed, const string &szRecords, bool fRehearsed)
{
    const string szFolder = szRecords + "/" + to_string(seed);
    const PLAN plan = PlanMake(seed, fRehearsed);
    RECORD record = RecordTake(plan, szFolder);
    vector<string> differences;
    if (fRehearsed) {
        RehearsalCompare(szFolder, record, differences);
    }
    ORACLE_CASE subject = plan.subject;
    subject.machine = record.machine;
    if (PlanDestroys(plan)) {
        DestroyCompare(plan, record, differences);
    } else {
        ModelCompare(subject, record, differences);
    }
    SetUpCheck(plan, record, differences);
    string szText = differences.empty() ? "" : OracleCaseText(subject);
    for (const string &szDifference : differences) {
        szText += "difference in " + szDifference;
    }
    const string szFailed = record.szFailed.empty() ? "" : ", failed: " + record.szFailed;
    VerdictTell("seed " + to_string(seed), szText,
                Head(plan, record) + (fRehearsed ? szFailed : ""));
    return !record.szFailed.empty() || !differences.empty() ? ""
           : PlanDestroys(plan) && !HasArray(plan)          ? "destroy of nothing"
                                                            : plan.subject.words[0];
}

void EnoughTell(const string &szName, u64 nSeen, u64 nMin)
{
    const string szSeen = to_string(nSeen) + " machines";
    VerdictTell(szName, nSeen < nMin ? szSeen + "\n" : "", szSeen);
}

int CompareAll(u64 first, u64 count, const string &szRecords, bool fRehearsed)
{
    std::map<string, u64> compared;
    for (u64 seed = first; seed < first + count; seed++) {
        compared[MachineCompare(seed, szRecords, fRehearsed)]++;
    }
    if (fRehearsed && count >= COMPARED_MIN) {
        EnoughTell(COMPARED, count - compared[""], COMPARED_MIN);
        for (const auto &[szCommand, nMin] : COMMANDS_MIN) {
            EnoughTell("enough of these for " + string(szCommand), compared[szCommand], nMin);
        }
    }
    return EXIT_SUCCESS;
}

int PlanAll(u64 first, u64 count, bool fRehearsed)
{
    for (u64 seed = first; seed < first + count; seed++) {
        const string szScript = PlanScript(PlanMake(seed, fRehearsed));
        (void)fwrite(szScript.data(), 1, szScript.size(), stdout);
    }
    return EXIT_SUCCESS;
}

} // namespace

int main(int argc, char *argv[])
{
    const string szWord = argc > 1 ? argv[1] : "";
    const bool fPlan = szWord == "plan";
    const bool fRehearsed = argc > 1 && strcmp(argv[argc - 1], "rehearsed") == 0;
    const int nWords = argc - (fRehearsed ? 1 : 0);
    u64 first = 0;
    u64 count = 0;
    if ((!fPlan && szWord != "compare") || nWords != (fPlan ? 4 : 5) ||
        !NumberTake(argv[2], first) || !NumberTake(argv[3], count)) {
        fprintf(stderr,
                "usage: oracle_real plan SEED N [rehearsed] | compare SEED N FOLDER [rehearsed]\n");
        return EXIT_FAILURE;
    }
    return fPlan ? PlanAll(first, count, fRehearsed)
                 : CompareAll(first, count, argv[4], fRehearsed);
}
