// SPDX-License-Identifier: MIT
#pragma once

// What the machine's rules say a command must do, as a pure function: a description of a machine
// and a command go in; every command run, every byte printed, every syslog line and the exit
// status come out. Nothing here runs anything, and nothing here is shared with the tool.

#include <cstdint>
#include <map>
#include <optional>
#include <set>
#include <span>
#include <string>
#include <utility>
#include <vector>

constexpr const char ORACLE_CONF_PATH[] = "/etc.defaults/nuroinfo.conf";
constexpr const char ORACLE_ERROR_LOG_PATH[] = "/var/log/space_operation_error.log";
constexpr const char ORACLE_MARKER_FORCE[] = "/.force_clean_all_disk";
constexpr const char ORACLE_MARKER_DUAL[] = "/tmp/.dualhead";
constexpr const char ORACLE_MARKER_SINGLE[] = "/tmp/.not.dualhead";
constexpr const char ORACLE_MDADM[] = "/sbin/mdadm";
constexpr const char ORACLE_SFDISK[] = "/sbin/sfdisk";
constexpr const char ORACLE_NURODD[] = "/bin/nurodd";

using ORACLE_WORDS = std::vector<std::string>;

// One geometry of the first two partitions, in sectors.
struct ORACLE_LAYOUT {
    std::uint32_t version;
    int raid;
    int builtin;
    std::uint64_t start1;
    std::uint64_t size1;
    std::uint64_t start2;
    std::uint64_t size2;
    std::uint64_t dataGap;
};

// How a tool answers one call.
struct ORACLE_REPLY {
    std::string szOut;
    std::string szErr;
    int nExit = 0;
    bool fKillCaller = false; // the process that called the tool is killed before the answer
};

// A partition as sysfs shows it; a file without a value here is not there.
struct ORACLE_PARTITION {
    std::optional<std::string> szStart;
    std::optional<std::string> szSize;
};

using ORACLE_PARTITIONS = std::map<int, ORACLE_PARTITION>;

struct ORACLE_MACHINE {
    std::optional<std::string> szConf;                       // the configuration file
    std::map<std::string, ORACLE_PARTITIONS> disks;          // /sys/block/<name>
    std::vector<std::string> md0Members;                     // in the order the directory is read
    bool fScsiHostFolder = true;                             // /sys/class/scsi_host
    std::map<std::string, std::optional<std::string>> hosts; // host -> text of nuro_pm_info
    std::set<std::string> markers;                           // marker files that exist
    std::set<std::string> missing;                           // programs that do not exist
    // Reply key -> replies of the first, second, ... call; the last one stays. A command that is
    // not named here says nothing and succeeds.
    std::map<std::string, std::vector<ORACLE_REPLY>> replies;
};

enum class ORACLE_KIND { COMMAND, SHELL, SLEEP, LOG, ERROR_LOG };

// One thing a process does that others can see.
struct ORACLE_ACTION {
    ORACLE_KIND kind;
    ORACLE_WORDS words;    // COMMAND, SHELL: the argument vector of the tool
    std::string szText;    // SHELL: what the shell is given; LOG, ERROR_LOG: the line
    int nNumber = 0;       // LOG: priority; SLEEP: seconds; SHELL: exit status
    bool fMissing = false; // SHELL: the tool that the text names does not exist
    std::string szErr{};   // SHELL: what reaches the tool's own standard error
};

// What one process does, in its order.
struct ORACLE_STRAND {
    std::string szDisk; // empty for the parent
    std::vector<ORACLE_ACTION> actions;
};

// Strands that run side by side. A phase ends before the next one begins.
using ORACLE_PHASE = std::vector<ORACLE_STRAND>;

struct ORACLE_ANSWER {
    std::vector<ORACLE_PHASE> phases;
    std::string szOut;
    int nStatus = 0;
    std::set<std::string> markers; // marker files that exist afterwards
};

// The geometries, in the order they are searched.
std::span<const ORACLE_LAYOUT> OracleLayouts();

// How a command is looked up in `replies`: its whole text, but without what follows from the run:
// the first three words where an array is created, program, number and disk where a partition is,
// the program alone for the duplication tool.
std::string OracleReplyKey(const ORACLE_WORDS &words);

// The argument lists of a shell text: redirections dropped, words split at blanks.
ORACLE_WORDS OracleShellWords(const std::string &szText);

// What the tool must do when it is run with `words` (without the program's own name).
ORACLE_ANSWER OracleAnswer(const ORACLE_MACHINE &machine, const ORACLE_WORDS &words);

// A syslog line without what no rule can know: source file, line, process number, the text of
// errno. The model's own lines come out in that form.
std::string OracleLineMask(const std::string &szLine);

// A line of the error log without its time stamp.
std::string OracleErrorLineMask(const std::string &szLine);
