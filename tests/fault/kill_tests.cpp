// SPDX-License-Identifier: MIT
//
// Kills the tool at every system call of every command that changes something, looks which row of
// the page of recovery has what it leaves, runs the command again, and compares what the machine is
// like with what an undisturbed run makes of it.
//
//     kill_tests [--all] [--every N] [--minimum FILE] [FILTER]
//
// The tool is killed alone, so that what it has started comes to its own end, or with all of that
// at any system call of its own processes. Without --all, one in N points is tried.
#include "pattern.h"
#include "private_root.h"
#include "sandbox.h"
#include "situations.h"
#include "storage_machine.h"
#include "suite.h"
#include "verdict.h"
#include "words.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <map>
#include <set>
#include <sstream>
#include <utility>

namespace
{

using std::string;
using std::to_string;
using STRINGS = std::vector<string>;
namespace fs = std::filesystem;

constexpr char RUNNER[] = "ARRAYCTL_RUNNER";

struct OPTIONS {
    bool fAll = false;
    std::uint64_t every = 3; // odd, so that both kinds of killing get their turn
};

// ---- machines that remember --------------------------------------------------------------------

string Superblock(const string &szPartition)
{
    return "/state/superblock/" + szPartition;
}

struct PLACE {
    int nPartition;
    std::uint64_t start;
    std::uint64_t size;
    const char *szMade; // how the partitioner is told to make it
};

constexpr PLACE PLACES[] = {
    {1, 2048, 4980480, "/sbin/sfdisk -N1 -uS -q -f -j2048 -z4980480 -tfd -F"},
    {2, 4982528, 4194304, "/sbin/sfdisk -N2 -uS -q -f -j0 -z4194304 -tfd -F"},
    {3, 9437184, 3145728, "/sbin/sfdisk -N3 * -uS -q -f -j260352 -z-1 -tfd -F"},
};

// What a machine remembers of partitions, superblocks, arrays and the volume on md2 is in files:
//
//     /sys/block/sda/sda1/{start,size}    a partition
//     /sys/block/md2/md/dev-sda3          a member of a running array, whose node is /dev/md2
//     /state/superblock/sda3              the number of the array that the partition belongs to
//     /state/{lv,vg,pv}                   what is left of the volume
//
// Tools answer by what is there, and write and remove these files.
void DiskRemembers(MACHINE &machine, const string &szDisk)
{
    const string szPath = " /dev/" + szDisk;
    STRINGS system;
    STRINGS data;
    for (const PLACE &place : PLACES) {
        const string szName = szDisk + to_string(place.nPartition);
        const string szNode = "/dev/" + szName;
        const string szFolder = "/sys/block/" + szDisk + "/" + szName;
        const string szStart = szFolder + "/start";
        const string szSize = szFolder + "/size";
        MachineTool(machine, place.szMade + szPath,
                    {.writes = {{szNode, ""},
                                {szStart, to_string(place.start) + "\n"},
                                {szSize, to_string(place.size) + "\n"}}});
        MachineTool(machine, ListingCommand(szDisk, place.nPartition),
                    {.szOut = Listing(szDisk, place.nPartition, place.start, place.size),
                     .szWhileThere = szStart});
        MachineTool(
            machine, "/sbin/mdadm -E " + szNode,
            {.szOut = Examination(place.nPartition - 1), .szWhileThere = Superblock(szName)});
        MachineTool(machine, "/sbin/mdadm --zero-superblock " + szNode,
                    {.removes = {Superblock(szName)}});
        STRINGS &removed = place.nPartition < 3 ? system : data;
        removed.insert(removed.end(), {szNode, szStart, szSize, szFolder});
    }
    MachineTool(machine, "/sbin/sfdisk --fast-delete 1:2" + szPath, {.removes = system});
    MachineTool(machine, "/sbin/sfdisk --fast-delete 3:128" + szPath, {.removes = data});
    system.insert(system.end(), data.begin(), data.end());
    MachineTool(machine, "/sbin/sfdisk --fast-delete -1" + szPath, {.removes = system});
}

// An array of these members is made, unless it is there.
void ArrayRemembers(MACHINE &machine, int nMd, const string &szOptions, const STRINGS &members)
{
    const string szMd = "/dev/md" + to_string(nMd);
    const string szFolder = "/sys/block/md" + to_string(nMd) + "/md/";
    const string szLast = szFolder + "sync_action"; // of what is written in the order of paths
    string szCommand = "/sbin/mdadm -C " + szMd + " " + szOptions;
    TOOL_ANSWER made = {.writes = {{szMd, ""}, {szLast, "idle\n"}}};
    for (const string &szMember : members) {
        szCommand += " /dev/" + szMember;
        made.writes[Superblock(szMember)] = to_string(nMd) + "\n";
        made.writes[szFolder + "dev-" + szMember + "/state"] = "in_sync\n";
        made.writes[szFolder + "dev-" + szMember + "/slot"] = "0\n";
    }
    MachineTool(machine, szCommand + " ...", {.status = 1, .szWhileThere = szLast});
    MachineTool(machine, szCommand + " ...", made);
}

void ArraysRemember(MACHINE &machine)
{
    const string szOptions = "-e 0.9 -amd -R -l1 ";
    for (const int nMd : {0, 1}) {
        const string szNumber = to_string(nMd + 1);
        ArrayRemembers(machine, nMd, szOptions + "*", {"sda" + szNumber, "sdb" + szNumber});
        ArrayRemembers(machine, nMd, szOptions + "-f *", {"sda" + szNumber});
        ArrayRemembers(machine, nMd, szOptions + "-f *", {"sdb" + szNumber});
    }
    ArrayRemembers(machine, 2, "-amd -R -l1 *", {"sda3", "sdb3"});

    const string szFolder = "/sys/block/md2/md";
    STRINGS removed;
    for (const string szMember : {"/dev-sda3", "/dev-sdb3"}) {
        removed.insert(removed.end(), {szFolder + szMember + "/state",
                                       szFolder + szMember + "/slot", szFolder + szMember});
    }
    removed.insert(removed.end(), {"/dev/md2", szFolder + "/sync_action",
                                   szFolder + "/component_size", szFolder, "/sys/block/md2"});
    const TOOL_ANSWER refused = {.szErr = "mdadm: cannot stop it\n", .status = 1};
    MachineTool(machine, "/sbin/mdadm -S /dev/md2",
                {.szErr = refused.szErr, .status = 1, .szWhileThere = "/state/lv"});
    MachineTool(machine, "/sbin/mdadm -S /dev/md2", {.removes = removed, .szWhileThere = szFolder});
    MachineTool(machine, "/sbin/mdadm -S /dev/md2", refused);
}

void VolumeRemembers(MACHINE &machine)
{
    const std::pair<string, string> parts[] = {{"lv", "vg1:lv1:"}, {"vg", "vg1::"}, {"pv", "::"}};
    for (const auto &[szPart, szRow] : parts) {
        const string szFile = "/state/" + szPart;
        const string szRemove = "/sbin/" + szPart + "remove ...";
        MachineTool(machine, "/sbin/pvs ...",
                    {.szOut = "  /dev/md2:" + szRow + "\n", .szWhileThere = szFile});
        MachineTool(machine, szRemove, {.removes = {szFile}, .szWhileThere = szFile});
        MachineTool(machine, szRemove, {.status = 5});
    }
    MachineTool(machine, "/bin/umount ...",
                {.writes = {{"/proc/mounts", "rootfs / rootfs rw 0 0\n"}}});
}

MACHINE Remembering(MACHINE machine)
{
    static const string szStepper = FileText(KILL_STEPPER).value_or("");
    MachineFile(machine, "/stepper", szStepper, 0755);
    MachineFolder(machine, "/state/superblock");
    DiskRemembers(machine, "sda");
    DiskRemembers(machine, "sdb");
    ArraysRemember(machine);
    VolumeRemembers(machine);
    return Relaxed(std::move(machine));
}

void SuperblockAdd(MACHINE &machine, const string &szPartition, int nMd)
{
    MachineFile(machine, Superblock(szPartition), to_string(nMd) + "\n");
}

// Two disks of the newest layout, md2 on their data partitions.
MACHINE WithDataDisks()
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    for (const char *const szDisk : {"sda", "sdb"}) {
        PartitionedDiskAdd(machine, szDisk, PLACES_8);
        SuperblockAdd(machine, MachinePartitionAdd(machine, szDisk, 3, 9437184, 2000000), 2);
    }
    return machine;
}

MACHINE WithDataArray()
{
    MACHINE machine = WithDataDisks();
    MachineMdAdd(machine, {.nMd = 2, .members = {{"sda3"}, {"sdb3"}}});
    return machine;
}

MACHINE WithVolume()
{
    MACHINE machine = WithDataArray();
    for (const char *const szPart : {"pv", "vg", "lv"}) {
        MachineFile(machine, string("/state/") + szPart, "");
    }
    machine.files["/proc/mounts"].szText += "/dev/vg1/lv1s1 /mnt/one ext4 rw 0 0\n";
    MachineFolder(machine, "/mnt/one");
    return machine;
}

// Why a line of the state may be there, or not be there, other than after an undisturbed run.
struct LEFT_OTHERWISE {
    bool fMissing;
    const char *szLine;
    const char *szReason;
};

struct KILL_CASE {
    string szName;
    MACHINE machine;
    STRINGS words;
    const char *szHad; // "data" or "blank": what its disks were; none where nothing is changed
    std::vector<LEFT_OTHERWISE> allowed = {};
};

constexpr LEFT_OTHERWISE STOPPED_BEFORE_WIPED = {
    false, "^/state/superblock/sd[ab]3 ",
    "an array that is stopped is not known any more, so superblocks that were not wiped yet stay"};
constexpr LEFT_OTHERWISE WIPED_HALF_RENEWED = {
    true, "^/sys/block/sd[ab]/sd[ab]3",
    "a disk that lost both system partitions counts as blank, so its data partition goes"};
constexpr LEFT_OTHERWISE LEFT_HALF_RENEWED = {
    true, "/(dev-)?sd[ab][12]",
    "a disk that lost one system partition is not known, so it is left alone beside one that is"};

constexpr LEFT_OTHERWISE SLOT_TAKEN = {
    false, "/(dev-)?sdb[12]", "and the slot of the disk that is left alone goes to the next"};

std::vector<KILL_CASE> CasesMake()
{
    const string szOneSlot = string(CONF_RAID) + "max_sys_raid_disks=\"1\"\n";
    return {
        {"status: an array", WithDataArray(), {"status", "2"}, nullptr},
        {"destroy: an array", WithDataArray(), {"destroy", "2"}, "data", {STOPPED_BEFORE_WIPED}},
        {"destroy: a mounted volume",
         WithVolume(),
         {"destroy", "2"},
         "data",
         {STOPPED_BEFORE_WIPED}},
        {"newvol: two disks", WithDataDisks(), {"newvol"}, "data"},
        {"initsys: blank disks",
         WithBlankDisks(CONF_RAID, {"sda", "sdb"}),
         {"initsys"},
         "blank",
         {LEFT_HALF_RENEWED}},
        {"initsys: disks that keep their data",
         WithDataDisks(),
         {"initsys"},
         "data",
         {WIPED_HALF_RENEWED, LEFT_HALF_RENEWED}},
        {"initsys: more disks than slots",
         WithBlankDisks(szOneSlot, {"sda", "sdb"}),
         {"initsys"},
         "blank",
         {LEFT_HALF_RENEWED, SLOT_TAKEN}},
        {"initsys-dd: one disk", WithBlankDisks(CONF_RAID, {"sda"}), {"initsys-dd"}, "blank"},
    };
}

// ---- what a machine is like --------------------------------------------------------------------

// One line for each file and folder that tells of disks, arrays and volumes.
STRINGS StateTake()
{
    STRINGS lines;
    const fs::path root = PrivateRootFolder();
    for (const char *const szFolder : {"sys/block", "state"}) {
        for (const fs::directory_entry &entry : fs::recursive_directory_iterator(root / szFolder)) {
            const string szPath = "/" + fs::relative(entry.path(), root).string();
            const string szText = FileText(entry.path().string()).value_or("");
            lines.push_back(szPath + " " + szText.substr(0, szText.find('\n')));
        }
    }
    lines.push_back("/proc/mounts " + MachineFileRead("/proc/mounts").value_or(""));
    std::sort(lines.begin(), lines.end());
    return lines;
}

STRINGS Without(const STRINGS &lines, const STRINGS &others)
{
    STRINGS rest;
    std::set_difference(lines.begin(), lines.end(), others.begin(), others.end(),
                        std::back_inserter(rest));
    return rest;
}

const LEFT_OTHERWISE *RowOf(const KILL_CASE &subject, const string &szLine, bool fMissing)
{
    for (const LEFT_OTHERWISE &row : subject.allowed) {
        if (row.fMissing == fMissing && PatternMatches(szLine, row.szLine)) {
            return &row;
        }
    }
    return nullptr;
}

// ---- the rows of the page of recovery -----------------------------------------------------------

// What the page's block prints of these disks behind a reboot.
string LookTake()
{
    const fs::path blocks = fs::path(PrivateRootFolder()) / "sys/block";
    string szLook;
    for (const string szDisk : {"sda", "sdb"}) {
        if (!fs::exists(blocks / szDisk)) {
            continue;
        }
        szLook += szDisk;
        for (const char *const szPart : {"1", "2", "3"}) {
            const string szName = szDisk + szPart;
            if (fs::exists(blocks / szDisk / szName / "start")) {
                const string szArray = MachineFileRead(Superblock(szName)).value_or("");
                szLook += string(" ") + szPart + ":" +
                          (szArray.empty() ? "-" : "md" + szArray.substr(0, szArray.find('\n')));
            }
        }
        szLook += "\n";
    }
    return szLook;
}

// "row N" or "ended" by the rules that the cases on real disks go by.
string RowByRules(const KILL_CASE &subject, const string &szLook)
{
    const string &szCommand = subject.words.front();
    const string szLine = "printf '%s' '" + szLook +
                          "' | awk -v ran=" + szCommand.substr(0, szCommand.find('-')) +
                          " -v had=" + subject.szHad + " -f " ROWS_OF_PAGE;
    char szRow[16] = "";
    FILE *const pRules = popen(szLine.c_str(), "r");
    const bool fRead = pRules != nullptr && fgets(szRow, sizeof(szRow), pRules) != nullptr;
    const bool fEnded = pRules != nullptr && pclose(pRules) == 0;
    return fRead && fEnded ? string(szRow).substr(0, strcspn(szRow, "\n")) : "";
}

bool PageHas(const string &szRow)
{
    static const string szPage = FileText(RECOVERY_PAGE).value_or("");
    return szRow == "ended" ||
           (szRow.starts_with("row ") &&
            szPage.find("\n### Row " + szRow.substr(strlen("row ")) + ":") != string::npos);
}

// What a kill leaves has to have a row, as a machine that is switched off then comes up with it.
void RowLook(const KILL_CASE &subject, TALLY &tally)
{
    static std::map<string, string> rows; // a few, for thousands of kills
    if (subject.szHad == nullptr) {
        return;
    }
    const string szLook = LookTake();
    const string szKey = subject.szName + szLook;
    if (!rows.contains(szKey)) {
        rows[szKey] = RowByRules(subject, szLook);
    }
    if (PageHas(rows[szKey])) {
        tally.allowed[subject.szName + ": a kill leaves " + rows[szKey]]++;
    } else {
        tally.wrong.push_back(subject.szName + ": a kill leaves what no row has\n" + szLook);
    }
}

// ---- one case ----------------------------------------------------------------------------------

struct POINT {
    string szProcess;
    int nEntry = 0;
    bool fAll = false;
};

// How often each process of the tool enters the kernel in an undisturbed run.
std::vector<POINT> PointsTake()
{
    std::vector<POINT> points;
    std::istringstream steps(MachineFileRead("/steps").value_or(""));
    string szProcess;
    int nEntries = 0;
    while (steps >> szProcess >> nEntries) {
        for (int nEntry = 1; nEntry <= nEntries; nEntry++) {
            points.push_back({szProcess, nEntry, true});
            if (szProcess == "0") {
                points.push_back({szProcess, nEntry, false});
            }
        }
    }
    return points;
}

RUN_RESULT SteppedRun(const KILL_CASE &subject, const POINT &point)
{
    const string szRunner = "/stepper " + point.szProcess + " " + to_string(point.nEntry) +
                            (point.fAll ? " all" : " alone");
    (void)setenv(RUNNER, szRunner.c_str(), 1);
    RUN_RESULT result = MachineTry(subject.machine, subject.words);
    (void)unsetenv(RUNNER);
    return result;
}

// Takes the lines that may differ for their reasons, and gives back the others.
STRINGS Unexplained(const KILL_CASE &subject, const STRINGS &lines, bool fMissing,
                    std::set<string> &reasons)
{
    STRINGS rest;
    for (const string &szLine : lines) {
        const LEFT_OTHERWISE *const pRow = RowOf(subject, szLine, fMissing);
        if (pRow == nullptr) {
            rest.push_back(string(fMissing ? "    missing: " : "    instead: ") + szLine + "\n");
        } else {
            reasons.insert(pRow->szReason);
        }
    }
    return rest;
}

void StateCompare(const KILL_CASE &subject, const POINT &point, const STRINGS &expected,
                  TALLY &tally)
{
    const STRINGS state = StateTake();
    std::set<string> reasons;
    STRINGS rest = Unexplained(subject, Without(expected, state), true, reasons);
    const STRINGS instead = Unexplained(subject, Without(state, expected), false, reasons);
    rest.insert(rest.end(), instead.begin(), instead.end());
    if (rest.empty()) {
        for (const string &szReason : reasons) {
            tally.allowed[subject.szName + ": " + szReason]++;
        }
        return;
    }
    string szText = subject.szName + ": killed" + (point.fAll ? " with its children" : "") +
                    " at system call " + to_string(point.nEntry) + " of process " +
                    point.szProcess + "\n";
    for (const string &szLine : rest) {
        szText += szLine;
    }
    tally.wrong.push_back(szText);
}

void PointTry(const KILL_CASE &subject, const POINT &point, const STRINGS &expected, TALLY &tally)
{
    const RUN_RESULT killed = SteppedRun(subject, point);
    RowLook(subject, tally);
    const RUN_RESULT again = MachineTryAgain(subject.machine, subject.words);
    tally.done++;
    if (killed.fTimedOut || again.fTimedOut || again.signal != 0) {
        tally.wrong.push_back(subject.szName + ": it hangs or breaks after a kill at " +
                              point.szProcess + " " + to_string(point.nEntry) + "\n");
        return;
    }
    StateCompare(subject, point, expected, tally);
}

TALLY CaseRun(const OPTIONS &options, const KILL_CASE &subject, size_t worker)
{
    TALLY tally;
    const RUN_RESULT clean = SteppedRun(subject, {"0", 0, false});
    const std::vector<POINT> points = PointsTake();
    const STRINGS expected = StateTake();
    if (clean.status != 0 || points.empty()) {
        tally.wrong.push_back(subject.szName + ": undisturbed it ends with status " +
                              to_string(clean.status) + "\n" + clean.szOut + clean.szErr);
        return tally;
    }
    size_t due = 0;
    for (size_t i = 0; i < points.size(); i++) {
        if ((options.fAll || i % options.every == 0) && due++ % VerdictWorkers() == worker) {
            PointTry(subject, points[i], expected, tally);
        }
    }
    return tally;
}

} // namespace

int main(int argc, char *argv[])
{
    OPTIONS options;
    std::vector<KILL_CASE> cases = CasesMake();
    SUITE suite = {.szDone = "kills", .work = [&](size_t test, size_t worker) {
                       return CaseRun(options, cases[test], worker);
                   }};
    for (KILL_CASE &subject : cases) {
        suite.names.push_back(subject.szName);
        subject.machine = Remembering(std::move(subject.machine));
    }
    const bool fTaken = OptionsTake(argc, argv,
                                    {{"--all", &options.fAll},
                                     {"--every", &options.every},
                                     {"", &suite.szFilter},
                                     {"--minimum", &suite.szMinimum}});
    if (!fTaken) {
        return EXIT_FAILURE;
    }
    SuiteRun(suite);
    return EXIT_SUCCESS;
}
