// SPDX-License-Identifier: MIT
#pragma once

// The sandbox suite: the finished, unmodified program and its libraries inside a private root.
//
// A test describes the machine (MACHINE), runs the program on it (MachineRun) or a piece of test
// code linked with the libraries (MachineCall), and compares the result (RUN_RESULT):
//
//     MACHINE machine = MachineMake();
//     MachineMdAdd(machine, {.nMd = 2, .members = {{"sda3"}, {"sdb3"}}});
//     MachineTool(machine, "/sbin/mdadm -S /dev/md2", {.status = 1, .nTimes = 3});
//     const RUN_RESULT result = MachineRun(machine, {"destroy", "2"});
//     EXPECT_EQ(result.szOut, "");
//     EXPECT_EQ(LogText(result), "<11>raid_remove.cpp:# Fail to stop [/dev/md2], try again\n"...);
//     EXPECT_EQ(TranscriptText(result), "/sbin/mdadm -S /dev/md2\nsleep 1\n"...);
//
// The tools that the program runs are stand-ins. They answer from the rows of MachineTool; a
// command that no row expects fails the test, and so does a row that was not run. So do a run that
// hangs, one that leaves a child behind, and a report of a sanitizer.
//
// Nothing of the host can be reached: the root is a tmpfs in a private user and mount namespace,
// every run has its own PID namespace, and /dev contains plain files.

#include <cstdint>
#include <functional>
#include <initializer_list>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <sys/types.h>
#include <vector>

// ---- the description of a machine --------------------------------------------------------------

struct MACHINE_FILE {
    std::string szText = {};
    mode_t mode = 0644;
};

// What a stand-in does when it is run with the argument list of its row.
struct TOOL_ANSWER {
    std::string szOut = {};
    std::string szErr = {};
    int status = 0;       // exit status
    int signal = 0;       // ends by this signal instead, when not 0
    int signalCaller = 0; // first kills the process that ran it with this signal, when not 0
    int msDelay = 0;      // waits before it answers
    int nMeet = 0;        // waits until this many such stand-ins were run; NEVER: for ever
    size_t cbFlood = 0;   // first writes this many bytes to standard output and standard error each
    int nTimes = 1;       // how often it must be run; ANY_TIMES for any number, 0 included
    std::map<std::string, std::string> writes =
        {};                                // files it writes on the machine, with their text
    std::vector<std::string> removes = {}; // files and folders it removes
    int msGrandchild = 0;                  // leaves a grandchild that holds its streams this long
    std::string szWhileThere = {};         // the row counts while this file or folder is there
};

constexpr int ANY_TIMES = -1;
constexpr int NEVER = 1000000;

// In the argument list of a row: any one argument, and any number of arguments at the end.
inline constexpr const char *ANY_ARGUMENT = "*";
inline constexpr const char *ANY_REST = "...";

struct TOOL_ROW {
    std::vector<std::string> argv; // argv[0] is the path of the tool
    TOOL_ANSWER answer;
};

enum class TOOL_KIND { STANDIN, MISSING, FOLDER, NOT_EXECUTABLE };

// One member directory /sys/block/mdN/md/dev-NAME. A file whose text is NO_FILE is not there.
inline constexpr const char *NO_FILE = "\1no file";

struct MACHINE_MEMBER {
    std::string szName = {};
    std::string szState = "in_sync\n";
    std::string szSlot = "0\n";
};

// An array as the md driver reports it. Each request can fail with an errno instead.
struct MACHINE_MD {
    int nMd = 0;
    int majorVersion = 1;
    int minorVersion = 2;
    int level = 1;
    int size = 1048576; // KiB used on each member, as the driver's signed 32-bit field
    int nRaidDisks = 2;
    int nActiveDisks = 2;
    int nSpareDisks = 0;
    std::uint64_t arraySize = 1073741824; // bytes
    int health = 0;                       // 0 normal, 1 degraded, 2 crashed
    std::uint64_t activity = 0;           // of the resync; 0 is none
    std::uint64_t done = 0;
    std::uint64_t total = 0;
    int errnoInfo = 0;
    int errnoSize = 0;
    int errnoHealth = 0;
    int errnoSync = 0;
    std::vector<MACHINE_MEMBER> members = {};
    std::string szSyncAction = "idle\n";
    std::string szComponentSize = "1048576\n"; // KiB
    unsigned int deviceMajor = 9;
    std::optional<unsigned int> deviceMinor = {}; // N of mdN unless said otherwise
};

// The answer to the size request of another device node, in bytes.
struct MACHINE_DEVICE_SIZE {
    std::string szPath;
    std::uint64_t cb = 0;
    int errnoSize = 0;
};

// The n-th call of a libc function fails with an errno; with fGoOn every later one too. Calls are
// counted in each process separately, and the transcript has "fault NAME N". The functions that can
// be made to fail are in a table in interpose.cpp; "*" stands for every one of them.
//
// A fault of one process counts the calls of that process only: "0" is the program, "0.2" the
// second process that it forked, "0.2.1" the first one forked by that. The transcript then has
// "fault NAME N PROCESS OBJECT", where all after the name is one word. With fGoOn the calls also
// fail in the processes that it forks from then on.
struct MACHINE_FAULT {
    std::string szFunction = {};
    int nCall = 1;
    int error = 12;
    bool fGoOn = false;
    std::string szProcess = "*";
};

struct MACHINE {
    std::map<std::string, MACHINE_FILE> files = {};
    std::set<std::string> folders = {};
    std::map<std::string, std::string> links = {}; // path -> target
    std::set<std::string> fifos = {};
    std::vector<MACHINE_MD> arrays = {};
    std::vector<MACHINE_DEVICE_SIZE> deviceSizes = {};
    std::vector<TOOL_ROW> rows = {};
    std::map<std::string, TOOL_KIND> tools = {}; // only those that are not plain stand-ins
    std::vector<MACHINE_FAULT> faults = {};
    std::map<std::string, std::string> environment = {{"PATH", "/sbin:/bin"}};
    std::int64_t when = 1793840523;         // what time() returns: Nov 05 01:02:03 in UTC
    std::string szInput = "the terminal\n"; // standard input of the program: never /dev/null
    bool fRealSleep = false;                // sleeps are in the transcript and take their time
    bool fCallsTold = false;                // lists calls that can be made to fail: MachineCalls
    bool fNoLog = false;                    // no /dev/log
    bool fMayLeaveChildren = false;
    // A run without a command, a sleep or a log line for this long hangs; 0 is the common bound.
    int msSilence = 0;
    std::function<void()> prepare = {}; // runs in the program's process just before it starts
};

// A machine with nothing but what every Linux has: empty /sys/block, /proc/partitions with its
// header, /proc/mounts with the root, /proc/devices with sd, md and mdp, /tmp, /var/log.
MACHINE MachineMake();

void MachineFile(MACHINE &machine, const std::string &szPath, const std::string &szText,
                 mode_t mode = 0644);
void MachineFolder(MACHINE &machine, const std::string &szPath);
void MachineLink(MACHINE &machine, const std::string &szPath, const std::string &szTarget);

// Removes a file or folder, with everything below it, from the machine.
void MachineRemove(MACHINE &machine, const std::string &szPath);

// Sets /etc.defaults/nuroinfo.conf; the second makes a machine that has nothing else.
void MachineConf(MACHINE &machine, const std::string &szText);
MACHINE MachineWithConf(const std::string &szText);

// A disk: /sys/block/NAME, /dev/NAME, its line in /proc/partitions.
void MachineDiskAdd(MACHINE &machine, const std::string &szDisk, std::uint64_t nSector = 12582912);

// Partition n of a disk: start and size files in sysfs, node, line in /proc/partitions. The name
// has a "p" before the number where the disk's name ends in a digit. Returns its name.
std::string MachinePartitionAdd(MACHINE &machine, const std::string &szDisk, int nPartition,
                                std::uint64_t start, std::uint64_t size);

// An array: /dev/mdN, its sysfs files, its members, its answers to requests.
void MachineMdAdd(MACHINE &machine, const MACHINE_MD &md);

// Adds an expected command and its answer. The text form is split at single blanks; the list forms
// allow empty arguments and arguments with blanks.
void MachineTool(MACHINE &machine, std::string_view szCommand, const TOOL_ANSWER &answer = {});
void MachineTool(MACHINE &machine, const std::vector<std::string> &argv,
                 const TOOL_ANSWER &answer = {});
void MachineTool(MACHINE &machine, std::initializer_list<std::string> argv,
                 const TOOL_ANSWER &answer = {});

// ---- the result of a run -----------------------------------------------------------------------

struct LOG_LINE {
    int priority = 0;        // as sent: 11 is LOG_ERR, 15 LOG_DEBUG
    std::string szTag = {};  // the program's name
    std::string szText = {}; // "file.cpp:# message": the line number is masked
};

enum class EVENT_KIND { COMMAND, SLEEP, FAULT };

// What happened, in order: a command, a sleep, a fault.
struct RUN_EVENT {
    EVENT_KIND kind = EVENT_KIND::COMMAND;
    std::vector<std::string> argv = {}; // a sleep: "sleep" and its seconds; a fault: see above
    std::string szExecuted = {};        // the path that was executed
    bool fExpected = true;
    bool fNullInput = false;  // standard input is /dev/null
    bool fNullOutput = false; // standard output is /dev/null
    bool fNullError = false;
    int nDescriptors = 0;  // open descriptors above 2
    size_t nLogBefore = 0; // syslog lines that came before
    std::vector<std::string> environment = {};
};

struct RUN_RESULT {
    std::string szOut = {};
    std::string szErr = {};
    int status = -1; // exit status; -1 when it ended by a signal or did not end
    int signal = 0;
    std::vector<LOG_LINE> log = {};
    std::vector<RUN_EVENT> events = {};
    bool fTimedOut = false;
    int nUnreaped = 0; // children that the program did not wait for
    int nRunning = 0;  // children that were still running when it ended
    double seconds = 0;
    std::vector<std::string> problems = {}; // each fails the test, see MachineRun
};

// One line each: "<11>file.cpp:# message".
std::string LogText(const RUN_RESULT &result);

// One line each: the argument list separated by blanks, "sleep 3", "fault calloc 1". An argument
// that is empty or contains blanks or quotes is in double quotes.
std::string TranscriptText(const RUN_RESULT &result);

// Both in the order in which they came; those of parallel processes in any order.
std::string OrderText(const RUN_RESULT &result);

// Joins expected lines in the form of these texts, one line each.
std::string Lines(const std::vector<std::string> &lines);

// ---- running -----------------------------------------------------------------------------------

// Lays the machine out and runs the program with these arguments. Every problem fails the test.
RUN_RESULT MachineRun(const MACHINE &machine, const std::vector<std::string> &arguments);

// The same. It ends with this status, with nothing on standard error, and prints this, if said.
RUN_RESULT RunEnds(const MACHINE &machine, const std::vector<std::string> &arguments, int status);
RUN_RESULT RunEnds(const MACHINE &machine, const std::vector<std::string> &arguments, int status,
                   const std::string &szOut);

// The same, but problems are only listed in the result.
RUN_RESULT MachineTry(const MACHINE &machine, const std::vector<std::string> &arguments);

// Runs the program on the machine as the last run left it. Only the rows, faults and the answers
// of the arrays are taken from `machine`, no file is laid out.
RUN_RESULT MachineRunAgain(const MACHINE &machine, const std::vector<std::string> &arguments);
RUN_RESULT MachineTryAgain(const MACHINE &machine, const std::vector<std::string> &arguments);

// Lays the machine out and runs the body in a process of its own inside it, linked with the
// libraries. EXPECT and ASSERT failures of the body fail the test. What the body prints is in
// szOut. When bodies run in a test program for another processor, that program does not have the
// results of earlier calls: a test must reach its later calls whatever the earlier ones returned.
RUN_RESULT MachineCall(const MACHINE &machine, const std::function<void()> &body);

// The same; QuietCall expects that nothing is logged, IdleCall that nothing is run either.
RUN_RESULT QuietCall(const MACHINE &machine, const std::function<void()> &body);
RUN_RESULT IdleCall(const MACHINE &machine, const std::function<void()> &body);

// After a run of a machine with fCallsTold: each call that can be made to fail, in order within its
// process, as "PROCESS FUNCTION OBJECT".
std::vector<std::string> MachineCalls();

// The text of a file of the machine after a run; nullopt when it does not exist.
std::optional<std::string> MachineFileRead(const std::string &szPath);
