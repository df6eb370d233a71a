// SPDX-License-Identifier: MIT
#include "oracle_layout.h"

#include <csignal>

namespace
{

using std::string;
using std::to_string;
using std::vector;

constexpr const char SHELL[] = "/bin/sh";
constexpr const char MD0_MEMBER[] = "/sys/block/md0/md/dev-";

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

} // namespace

bool OracleShellIsStandin(const ORACLE_CASE &subject)
{
    return subject.seed % 2 == 1;
}

MACHINE OracleMachineLayOut(const ORACLE_CASE &subject, const std::vector<ORACLE_ANSWER> &answers)
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
    if (OracleShellIsStandin(subject)) {
        ShellLayOut(answers, made);
    }
    return made;
}
