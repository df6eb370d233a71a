// SPDX-License-Identifier: MIT
#include "array_machine.h"

#include "oracle_dice.h"
#include "words.h"

#include <algorithm>
#include <cerrno>

namespace
{

using std::string;
using std::to_string;
using std::vector;
using u64 = std::uint64_t;

constexpr u64 SECTORS = 1048576; // of each partition
constexpr u64 DISKS_MAX = 6;
constexpr u64 MEMBERS_MAX = 4;
constexpr int FIRST_DATA_PARTITION = 3;
constexpr char ROWS[] = "/sbin/pvs -o pv_name,vg_name,lv_name,origin --noheading --separator :";
constexpr const char *PROGRAMS[] = {"/sbin/mdadm",    "/sbin/pvs",      "/sbin/lvremove",
                                    "/sbin/vgremove", "/sbin/pvremove", "/bin/umount"};

string UuidOf(int nMd)
{
    return "5b1f2c3d:4e5f6071:8293a4b5:" + to_string(10000000 + nMd);
}

string DevicePath(int nMd)
{
    return "/dev/md" + to_string(nMd);
}

// ---- disks and arrays --------------------------------------------------------------------------

vector<string> DisksAdd(DICE &dice, MACHINE &machine)
{
    vector<string> partitions;
    const u64 nDisks = 1 + Below(dice, DISKS_MAX);
    for (u64 i = 0; i < nDisks; i++) {
        const string szDisk = string("sd") + static_cast<char>('a' + i);
        MachineDiskAdd(machine, szDisk);
        const int nLast = FIRST_DATA_PARTITION + static_cast<int>(Below(dice, 3));
        for (int n = 1; n <= nLast; n++) {
            partitions.push_back(MachinePartitionAdd(
                machine, szDisk, n, 2048 + SECTORS * static_cast<u64>(n - 1), SECTORS));
        }
    }
    return partitions;
}

MACHINE_MD ArrayMake(DICE &dice, int nMd, const vector<string> &members)
{
    static const vector<string> states = {"in_sync\n", "in_sync\n", "in_sync\n", "faulty\n",
                                          "spare\n"};
    MACHINE_MD md = {.nMd = nMd, .level = Pick(dice, vector<int>{-1, 0, 1, 5, 6, 10})};
    md.nRaidDisks = static_cast<int>(members.size());
    md.health = static_cast<int>(Below(dice, 3));
    md.errnoInfo = Chance(dice, 5) ? ENODEV : 0;
    if (Chance(dice, 50)) {
        md.majorVersion = 0;
        md.minorVersion = 90;
    }
    for (size_t i = 0; i < members.size(); i++) {
        md.members.push_back({members[i], Pick(dice, states), to_string(i) + "\n"});
    }
    return md;
}

bool IsSystem(const string &szPartition)
{
    return szPartition.back() - '0' < FIRST_DATA_PARTITION;
}

// The system array lies on first partitions, and data arrays on any behind the second.
vector<MACHINE_MD> ArraysMake(DICE &dice, const vector<string> &partitions)
{
    vector<MACHINE_MD> arrays;
    vector<string> system;
    vector<string> data;
    std::copy_if(partitions.begin(), partitions.end(), std::back_inserter(system),
                 [](const string &szName) { return szName.back() == '1'; });
    std::copy_if(partitions.begin(), partitions.end(), std::back_inserter(data),
                 [](const string &szName) { return !IsSystem(szName); });
    if (Chance(dice, 20)) {
        arrays.push_back(ArrayMake(dice, 0, system));
    }
    vector<int> numbers = {2, 3, 20, 21, 127};
    std::shuffle(numbers.begin(), numbers.end(), dice);
    std::shuffle(data.begin(), data.end(), dice);
    while (!data.empty() && !numbers.empty() && Chance(dice, 85)) {
        const size_t nMembers = std::min<size_t>(data.size(), 1 + Below(dice, MEMBERS_MAX));
        arrays.push_back(
            ArrayMake(dice, numbers.back(),
                      {data.end() - static_cast<std::ptrdiff_t>(nMembers), data.end()}));
        data.resize(data.size() - nMembers);
        numbers.pop_back();
    }
    return arrays;
}

// ---- what the programs say ---------------------------------------------------------------------

TOOL_ANSWER ReportOf(DICE &dice, const string &szUuid)
{
    TOOL_ANSWER answer = {.nTimes = ANY_TIMES};
    const u64 roll = Below(dice, 100);
    if (szUuid.empty() || roll < 4) {
        answer.szErr = "mdadm: No md superblock detected.\n";
        answer.status = 1;
    } else if (roll < 8) {
        answer.szOut = "/dev/sdx3:\n     Array UUID\n";
    } else if (roll < 12) {
        answer.szOut = "/dev/sdx3:\n          Magic : a92b4efc\n";
    } else {
        answer.szOut = "/dev/sdx3:\n          Magic : a92b4efc\n     Array UUID : " + szUuid + "\n";
    }
    return answer;
}

// A partition outside of all arrays may keep the superblock of one that it left.
void ReportsAdd(DICE &dice, const vector<string> &partitions, MACHINE &machine)
{
    for (const string &szName : partitions) {
        string szUuid;
        for (const MACHINE_MD &md : machine.arrays) {
            const bool fMember =
                std::any_of(md.members.begin(), md.members.end(),
                            [&](const MACHINE_MEMBER &member) { return member.szName == szName; });
            szUuid = fMember || (szUuid.empty() && Chance(dice, 15)) ? UuidOf(md.nMd) : szUuid;
        }
        MachineTool(machine, "/sbin/mdadm -E /dev/" + szName, ReportOf(dice, szUuid));
    }
}

// Each with its volumes; some are mounted, and of some a snapshot is.
void GroupsAdd(DICE &dice, MACHINE &machine)
{
    string szRows = Chance(dice, 30) ? "  /dev/sda5:vg0:root:\n" : "";
    string szMounts = machine.files.at("/proc/mounts").szText;
    for (const MACHINE_MD &md : machine.arrays) {
        const string szGroup = "vg" + to_string(md.nMd);
        const u64 nVolumes = Chance(dice, 60) ? Below(dice, 3) : 0;
        for (u64 i = 1; i <= nVolumes; i++) {
            const string szVolume = szGroup + "/volume_" + to_string(i);
            const bool fTorn = Chance(dice, 4);
            szRows += "  " + DevicePath(md.nMd) +
                      (fTorn ? "" : ":" + szGroup + ":volume_" + to_string(i) + ":") + "\n";
            szMounts += Chance(dice, 40) ? "/dev/" + szVolume + " /volume ext4 rw 0 0\n" : "";
            szMounts += Chance(dice, 40)
                            ? "/dev/" + szVolume + "snap /snap/" + to_string(i) +
                                  Pick(dice, vector<string>{" ext4", " aufs"}) + " rw 0 0\n"
                            : "";
        }
    }
    MachineFile(machine, "/proc/mounts", szMounts);
    MachineTool(machine, ROWS, {.szOut = szRows, .nTimes = ANY_TIMES});
}

// Every other call succeeds in silence, unless there is no such program.
void ProgramsAdd(DICE &dice, MACHINE &machine)
{
    for (const char *const szProgram : PROGRAMS) {
        MachineTool(machine, vector<string>{szProgram, ANY_REST}, {.nTimes = ANY_TIMES});
        if (Chance(dice, 2)) {
            machine.tools[szProgram] = TOOL_KIND::MISSING;
        }
    }
}

} // namespace

ARRAY_CASE ArrayCaseMake(std::uint64_t seed)
{
    DICE dice(seed);
    ARRAY_CASE made;
    made.machine = MachineMake();
    const vector<string> partitions = DisksAdd(dice, made.machine);
    vector<MACHINE_MD> arrays = ArraysMake(dice, partitions);
    for (const MACHINE_MD &md : arrays) {
        MachineMdAdd(made.machine, md);
    }
    ReportsAdd(dice, partitions, made.machine);
    GroupsAdd(dice, made.machine);
    ProgramsAdd(dice, made.machine);
    arrays.push_back({.nMd = 9, .errnoInfo = ENODEV});
    const MACHINE_MD &meant =
        arrays[arrays.size() > 1 && Chance(dice, 90) ? Below(dice, arrays.size() - 1)
                                                     : arrays.size() - 1];
    made.words = {Chance(dice, 75) ? "destroy" : "status", to_string(meant.nMd)};
    made.fStops = made.words[0] == "destroy" && meant.errnoInfo == 0 &&
                  !made.machine.tools.contains("/sbin/mdadm");
    return made;
}

std::string ArrayCaseText(const ARRAY_CASE &subject)
{
    string text = "  command: " + subject.words[0] + " " + subject.words[1] + "\n";
    for (const MACHINE_MD &md : subject.machine.arrays) {
        text += "  " + DevicePath(md.nMd) + (md.errnoInfo == 0 ? "" : ", inactive") + ", members";
        for (const MACHINE_MEMBER &member : md.members) {
            text += " " + member.szName;
        }
        text += "\n";
    }
    text += "  /proc/mounts: " + Quoted(subject.machine.files.at("/proc/mounts").szText) + "\n";
    for (const auto &[szProgram, kind] : subject.machine.tools) {
        text += "  missing program " + szProgram + "\n";
    }
    for (const TOOL_ROW &row : subject.machine.rows) {
        text += row.answer.szOut.empty() ? ""
                                         : "  [" + row.argv[0] + " ... " + row.argv.back() + "] " +
                                               Quoted(row.answer.szOut) + "\n";
    }
    return text;
}
