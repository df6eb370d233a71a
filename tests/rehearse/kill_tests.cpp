// SPDX-License-Identifier: MIT
//
// Kills a rehearsal at every system call of each of its processes: no process, mount or file stays,
// and nothing has reached the system log.
//
//     rehearse_kill [--every N] [FILTER]
//
// Killed is one process at a time, as a person would: what it leaves has to end by itself.
#include "other_program.h"
#include "private_root.h"
#include "rehearsal.h"
#include "suite.h"
#include "verdict.h"
#include "words.h"

#include <cstdlib>
#include <sstream>

namespace
{

using std::string;
using std::to_string;
using STRINGS = std::vector<string>;

constexpr char EXAMINED[] = "/sbin/mdadm -E /dev/sda1";
constexpr char ROWS[] = "/sbin/pvs -o pv_name,vg_name,lv_name,origin --noheading --separator :";

struct OPTIONS {
    std::uint64_t every = 1;
};

struct KILL_CASE {
    const char *szName;
    const char *szScript; // what the tool does
    STRINGS options;
    bool fEndless; // so only the process that waits for all others comes as far as that
};

const KILL_CASE CASES[] = {
    {"commands: a tool that ends",
     "/sbin/mdadm -E /dev/sda1; /sbin/mdadm -S /dev/md2\n",
     {},
     false},
    {"leftovers: a tool that writes, and leaves a process",
     "echo x >/tmp/left; echo x >/var/log/left; sleep 1000 &\n/bin/umount -R /mnt\n",
     {"--json"},
     false},
    {"endless: a tool that never ends", "sleep 1000 & sleep 1000\n", {"--commands"}, true},
};

MACHINE CaseMachine(const string &szScript)
{
    static const string szStepper = FileText(KILL_STEPPER).value_or("");
    MACHINE machine = MachineMake();
    MachineFile(machine, "/stepper", szStepper, 0755);
    MachineFile(machine, "/steps", "");
    MachineFile(machine, "/tmp/raid.1", "");
    MachineFile(machine, "/tmp/other", "stays\n");
    MachineDiskAdd(machine, "sda");
    MachinePartitionAdd(machine, "sda", 1, 2048, 4980480);
    MachineTool(machine, EXAMINED, {.szOut = "a report\n", .nTimes = ANY_TIMES});
    MachineTool(machine, ROWS, {.szOut = "  /dev/md2:vg1:lv1:\n", .nTimes = ANY_TIMES});
    RehearsalAdd(machine);
    RehearsalToolAdd(machine, szScript);
    return machine;
}

// The words that rehearse, killed at a system call of a process; at 0 it is left alone.
STRINGS SteppedWords(const KILL_CASE &subject, const string &szProcess, int nEntry)
{
    STRINGS options = subject.options;
    options.insert(options.end(), {"--tool", REHEARSAL_OWN_TOOL, "any"});
    const STRINGS words = RehearsalWords(options);
    STRINGS stepped = {"/stepper", szProcess, to_string(nEntry), "alone", "-0", "rehearsal"};
    stepped.insert(stepped.end(), words.begin(), words.end());
    return stepped;
}

struct POINT {
    string szProcess;
    int nEntry = 0;
};

constexpr char WATCHER[] = "0";

// How often each process of the rehearsal enters the kernel when it is left alone. The last that
// the watcher does is to end, and with a tool that does not it never comes to that.
std::vector<POINT> PointsTake(bool fEndless)
{
    std::vector<POINT> points;
    std::istringstream steps(MachineFileRead("/steps").value_or(""));
    string szProcess;
    int nEntries = 0;
    while (steps >> szProcess >> nEntries) {
        nEntries = !fEndless ? nEntries : szProcess == WATCHER ? nEntries - 1 : 0;
        for (int nEntry = 1; nEntry <= nEntries; nEntry++) {
            points.push_back({szProcess, nEntry});
        }
    }
    return points;
}

// All but the stepper's own file, whose times change.
STRINGS PictureTake()
{
    STRINGS picture = RehearsalPicture();
    std::erase_if(picture, [](const string &szLine) { return szLine.starts_with("/steps "); });
    return picture;
}

// The stepper ends when no process of the rehearsal is left; one that stays makes it hang.
string PointTry(const KILL_CASE &subject, const MACHINE &machine, const POINT &point,
                const STRINGS &before)
{
    const RUN_RESULT result =
        MachineTryOtherAgain(machine, SteppedWords(subject, point.szProcess, point.nEntry));
    string szWrong = RehearsalDifference(before, PictureTake());
    if (result.fTimedOut) {
        szWrong += "    a process stays\n";
    }
    if (!LogText(result).empty()) {
        szWrong += "    in the system log: " + LogText(result);
    }
    return szWrong.empty()
               ? ""
               : string(subject.szName) + ": killed at system call " + to_string(point.nEntry) +
                     " of process " + point.szProcess + "\n" + szWrong;
}

STRINGS Whole(const KILL_CASE &subject)
{
    return SteppedWords(subject, WATCHER, 0);
}

// Laid out anew.
STRINGS MachineFresh(const MACHINE &machine)
{
    (void)MachineTryOther(machine, {"/bin/sh", "-c", ":"});
    return PictureTake();
}

TALLY CaseRun(const OPTIONS &options, const KILL_CASE &subject, size_t worker)
{
    TALLY tally;
    const MACHINE machine = CaseMachine(subject.szScript);
    const RUN_RESULT whole =
        MachineTryOther(subject.fEndless ? CaseMachine("") : machine, Whole(subject));
    const std::vector<POINT> points = PointsTake(subject.fEndless);
    if (whole.status != 3 || points.empty()) { // a marker is set
        tally.wrong.push_back(string(subject.szName) + ": left alone it ends with status " +
                              to_string(whole.status) + "\n" + whole.szOut + whole.szErr);
        return tally;
    }
    STRINGS before = MachineFresh(machine);
    size_t due = 0;
    for (size_t i = 0; i < points.size(); i += options.every) {
        if (due++ % VerdictWorkers() != worker) {
            continue;
        }
        tally.done++;
        const string szWrong = PointTry(subject, machine, points[i], before);
        if (!szWrong.empty()) {
            tally.wrong.push_back(szWrong);
            before = MachineFresh(machine);
        }
    }
    return tally;
}

} // namespace

int main(int argc, char *argv[])
{
    OPTIONS options;
    SUITE suite = {.szDone = "kills", .work = [&](size_t test, size_t worker) {
                       return CaseRun(options, CASES[test], worker);
                   }};
    for (const KILL_CASE &subject : CASES) {
        suite.names.emplace_back(subject.szName);
    }
    if (!OptionsTake(argc, argv, {{"--every", &options.every}, {"", &suite.szFilter}})) {
        return EXIT_FAILURE;
    }
    SuiteRun(suite);
    return EXIT_SUCCESS;
}
