// SPDX-License-Identifier: MIT
#include "oracle_plan.h"

#include "oracle_dice.h"

#include <algorithm>
#include <array>

namespace
{

using std::string;
using std::to_string;
using std::vector;
using u64 = std::uint64_t;

constexpr u64 DRAWS_PER_SEED = 1000000; // each seed draws from machines of its own
constexpr char LETTER_LAST = 'j';       // the last disk that the appliance has
constexpr u64 DISKS_MAX = 8;
constexpr u64 UNITS_MAX = 4;
constexpr u64 DUAL_EVERY = 5;
constexpr u64 IDLE_EVERY = 11;
constexpr u64 GAP = 2048;
constexpr u64 DATA_SIZE = 65536;
constexpr int TYPE_RAID = 0xfd;
constexpr int TYPE_EXTENDED = 0x05;
constexpr size_t SECTOR = 512;
constexpr u64 DESTROY_EVERY = 4;
constexpr char DESTROY[] = "destroy";

// ---------------------------------------------------------------------------- which can be real

bool NameIsReal(const string &szName)
{
    return szName.size() == 3 && szName.compare(0, 2, "sd") == 0 && szName[2] <= LETTER_LAST;
}

bool TableIsReal(const ORACLE_PARTITIONS &table)
{
    return std::all_of(table.begin(), table.end(), [](const auto &entry) {
        const auto fNumber = [](const std::optional<string> &szFile) {
            return szFile && !szFile->empty() && (*szFile)[0] >= '0' && (*szFile)[0] <= '9';
        };
        return fNumber(entry.second.szStart) && fNumber(entry.second.szSize);
    });
}

bool MachineIsReal(const ORACLE_MACHINE &machine)
{
    const bool fDisks =
        std::all_of(machine.disks.begin(), machine.disks.end(), [](const auto &disk) {
            return NameIsReal(disk.first) && TableIsReal(disk.second);
        });
    const auto fThere = [&](const string &szMember) {
        const auto disk = machine.disks.find(szMember.substr(0, szMember.size() - 1));
        return disk != machine.disks.end() && disk->second.count(1) != 0;
    };
    return fDisks && machine.fScsiHostFolder &&
           std::all_of(machine.md0Members.begin(), machine.md0Members.end(), fThere);
}

// One in so many machines may be without a disk for the tool.
bool HasWork(const ORACLE_ANSWER &answer, u64 seed)
{
    const auto fRuns = [](const ORACLE_ACTION &action) {
        return action.kind == ORACLE_KIND::COMMAND;
    };
    bool fAny = seed % IDLE_EVERY == 0;
    for (const ORACLE_PHASE &phase : answer.phases) {
        for (const ORACLE_STRAND &strand : phase) {
            fAny = fAny || std::any_of(strand.actions.begin(), strand.actions.end(), fRuns);
        }
    }
    return fAny;
}

// Data partitions follow system partitions: a machine with a blank disk gets no volume, and every
// other new volume is to come into being.
bool HasRoomForData(const ORACLE_CASE &subject, u64 seed)
{
    const auto fBoth = [](const auto &disk) { return disk.second.size() > 1; };
    const auto &disks = subject.machine.disks;
    return subject.words[0] != "newvol" || seed % 2 == 0 ||
           std::all_of(disks.begin(), disks.end(), fBoth);
}

// Neighbouring seeds take the families of commands and the numbers of disks in turn.
bool CaseIsWanted(const ORACLE_CASE &subject, u64 seed)
{
    const std::array<string, 3> families = {"initsys", "newvol", "enumformatalldisks"};
    const bool fDual = seed % DUAL_EVERY == 0;
    const u64 nDisks = 1 + seed % (fDual ? UNITS_MAX : DISKS_MAX);
    const string &szFamily = families[seed % families.size()];
    if (subject.words[0].compare(0, szFamily.size(), szFamily) != 0 ||
        subject.machine.disks.size() != nDisks || !MachineIsReal(subject.machine) ||
        !HasRoomForData(subject, seed)) {
        return false;
    }
    const ORACLE_ANSWER answer = OracleAnswer(subject.machine, subject.words);
    return (answer.markers.count(ORACLE_MARKER_DUAL) != 0) == fDual && HasWork(answer, seed);
}

// An array can be destroyed on a machine that has room for its members.
bool CaseIsWantedForArrays(const ORACLE_CASE &subject, u64 seed)
{
    const auto &disks = subject.machine.disks;
    const auto nWithRoom = std::count_if(disks.begin(), disks.end(),
                                         [](const auto &disk) { return disk.second.size() > 1; });
    return MachineIsReal(subject.machine) && disks.size() == 1 + seed / DESTROY_EVERY % DISKS_MAX &&
           2 * nWithRoom >= static_cast<std::ptrdiff_t>(disks.size());
}

ORACLE_CASE CaseFind(u64 seed, bool fArrays)
{
    for (u64 draw = seed * DRAWS_PER_SEED;; draw++) {
        ORACLE_CASE subject = OracleCaseMake(draw);
        subject.machine.replies.clear();
        subject.machine.disks.erase("loop0");
        subject.machine.disks.erase("mmcblk0");
        if (fArrays ? CaseIsWantedForArrays(subject, seed) : CaseIsWanted(subject, seed)) {
            subject.seed = seed;
            return subject;
        }
    }
}

// --------------------------------------------------------------------------------------- disks

// Behind the system partitions: one for data, and one in an extended partition.
void DataAdd(DICE &dice, vector<PLAN_PARTITION> &table)
{
    u64 end = 0;
    for (const PLAN_PARTITION &partition : table) {
        end = std::max(end, partition.start + partition.size);
    }
    if (Chance(dice, 70)) {
        table.push_back({3, end + GAP, DATA_SIZE, TYPE_RAID});
        end += GAP + DATA_SIZE;
    }
    if (Chance(dice, 30)) {
        table.push_back({4, end + GAP, GAP + DATA_SIZE, TYPE_EXTENDED});
        table.push_back({5, end + GAP + GAP, DATA_SIZE, TYPE_RAID});
    }
}

PLAN_DISK DiskMake(DICE &dice, const ORACLE_PARTITIONS &table)
{
    PLAN_DISK disk;
    for (const auto &[number, partition] : table) {
        disk.table.push_back(
            {number, std::stoull(*partition.szStart), std::stoull(*partition.szSize), TYPE_RAID});
    }
    disk.fGpt = table.count(1) != 0 && *table.at(1).szSize == "1048576\n" && Chance(dice, 40);
    if (table.size() > 1 && !disk.fGpt) {
        DataAdd(dice, disk.table);
    }
    return disk;
}

// Superblocks on whole disks stand at their ends, where no table is in their way.
void WholeAdd(DICE &dice, PLAN &plan)
{
    static const vector<int> numbers = {2, 99, 100, 101, 101, 102};
    for (auto &[szName, disk] : plan.disks) {
        if (!disk.fGpt && Chance(dice, 20)) {
            disk.nWholeMd = Pick(dice, numbers);
        }
    }
}

void ArraysAdd(DICE &dice, PLAN &plan, const vector<u64> &percents)
{
    static const vector<string> metadata = {"0.90", "0.90", "1.0", "1.1", "1.2", "1.2"};
    vector<string> candidates;
    const u64 percent = Pick(dice, percents);
    for (const auto &[szName, disk] : plan.disks) {
        for (const PLAN_PARTITION &partition : disk.table) {
            if ((partition.number == 3 || partition.number == 5) && Chance(dice, percent)) {
                candidates.push_back(szName + to_string(partition.number));
            }
        }
    }
    vector<int> numbers = {2, 3, 99, 100, 101, 102, 127};
    std::shuffle(numbers.begin(), numbers.end(), dice);
    std::shuffle(candidates.begin(), candidates.end(), dice);
    while (!candidates.empty() && !numbers.empty()) {
        PLAN_ARRAY array;
        array.nMd = numbers.back();
        numbers.pop_back();
        array.szMetadata = Pick(dice, metadata);
        array.szName = array.szMetadata != "0.90" && Chance(dice, 15) ? "volume" : "";
        const size_t count = std::min<size_t>(candidates.size(), 1 + Below(dice, 3));
        array.members.assign(candidates.end() - static_cast<std::ptrdiff_t>(count),
                             candidates.end());
        candidates.resize(candidates.size() - count);
        array.fSpare = count == 3 && Chance(dice, 40);
        array.fRunning = Chance(dice, 30);
        plan.arrays.push_back(array);
    }
}

int LevelMake(DICE &dice, const PLAN_ARRAY &array)
{
    static const vector<int> levels = {0, 1, 5, 10};
    const int nLevel = Pick(dice, levels);
    const bool fEnough = array.members.size() >= (nLevel == 5 ? 3 : 2);
    const bool fKnown =
        nLevel != 0 || array.szMetadata != "0.90"; // mdadm refuses these two together
    return fEnough && fKnown && !array.fSpare ? nLevel : 1;
}

// The array that the command takes apart runs, and may carry a group. Now and then it does not run,
// or there is none of this number.
void DestroyAdd(DICE &dice, PLAN &plan)
{
    ORACLE_WORDS &words = plan.subject.words;
    words = {DESTROY, "2"};
    plan.subject.machine.missing.clear();
    for (PLAN_ARRAY &array : plan.arrays) {
        array.nLevel = array.nMd == 0 ? 1 : LevelMake(dice, array);
    }
    if (plan.arrays.empty()) {
        return;
    }
    PLAN_ARRAY &array = plan.arrays[Below(dice, plan.arrays.size())];
    words[1] = to_string(array.nMd);
    array.fRunning = array.nMd == 0 || Chance(dice, 90);
    if (array.nMd != 0 && array.fRunning && Chance(dice, 60)) {
        array.nVolumes = static_cast<int>(1 + Below(dice, 2));
        array.fFull = Chance(dice, 75);
        array.fMounted = Chance(dice, 15);
    }
}

void SystemArrayAdd(PLAN &plan)
{
    if (!plan.subject.machine.md0Members.empty()) {
        PLAN_ARRAY array;
        array.szMetadata = "0.90";
        array.members = plan.subject.machine.md0Members;
        array.fRunning = true;
        plan.arrays.push_back(array);
    }
}

void FaultsAdd(DICE &dice, PLAN &plan)
{
    const string szDisk =
        "/dev/" +
        std::next(plan.disks.begin(), static_cast<std::ptrdiff_t>(Below(dice, plan.disks.size())))
            ->first;
    const vector<PLAN_FAULT> faults = {
        {"sfdisk", "--fast-delete 1:2 " + szDisk, 1, "cannot delete\n"},
        {"sfdisk", "--fast-delete 3:128 " + szDisk, 2, "in use\nnothing done\n"},
        {"sfdisk", "--fast-delete -1 " + szDisk, 1, ""},
        {"sfdisk", "-M1 " + szDisk, 1, "cannot open the disk\n"},
        {"sfdisk", "-N1 *" + szDisk, 4, "no line end"},
        {"sfdisk", "-N2 *" + szDisk, 1, ""},
        {"sfdisk", "-N3 *" + szDisk, 5, "no room\n"},
        {"sfdisk", "-N3 *" + szDisk, 0, "only a warning\n"},
        {"mdadm", "--zero-superblock " + szDisk + "1", 2, "mdadm: not today\n"},
        {"mdadm", "-C /dev/md0 *", 1, ""},
        {"mdadm", "-C /dev/md1 *", 2, ""},
        {"mdadm", "-C /dev/md2 *", 3, ""},
        {"nurodd", "*", 6, ""},
    };
    for (u64 count = Pick(dice, vector<u64>{0, 0, 1, 3}); count > 0; count--) {
        plan.faults.push_back(Pick(dice, faults));
    }
}

// --------------------------------------------------------------------------------------- script

string Quoted(const string &szText)
{
    string text = "'";
    for (const char letter : szText) {
        text += letter == '\'' ? string("'\\''") : string(1, letter);
    }
    return text + "'";
}

string Command(const vector<string> &words)
{
    string text = words[0];
    for (size_t i = 1; i < words.size(); i++) {
        text += " " + Quoted(words[i]);
    }
    return text + "\n";
}

void Little32(vector<unsigned char> &sector, size_t at, u64 value)
{
    for (size_t i = 0; i < 4; i++) {
        sector[at + i] = static_cast<unsigned char>(value >> (8 * i));
    }
}

// A partition sector as escapes for printf. Stock programs would not write tables that overlap.
string TableSector(const vector<PLAN_PARTITION> &entries)
{
    constexpr size_t ENTRIES = 446;
    constexpr size_t ENTRY = 16;
    vector<unsigned char> sector(SECTOR, 0);
    Little32(sector, 440, 0x0ac1e5);
    for (const PLAN_PARTITION &entry : entries) {
        const size_t at = ENTRIES + ENTRY * static_cast<size_t>(entry.number - 1);
        sector[at + 4] = static_cast<unsigned char>(entry.type);
        Little32(sector, at + 8, entry.start);
        Little32(sector, at + 12, entry.size);
    }
    sector[SECTOR - 2] = 0x55;
    sector[SECTOR - 1] = 0xaa;
    string text;
    for (const unsigned char byte : sector) {
        text += '\\';
        for (const int shift : {6, 3, 0}) {
            text += static_cast<char>('0' + ((byte >> shift) & 7));
        }
    }
    return text;
}

string GptScript(const string &szName, const PLAN_DISK &disk)
{
    string table = "label: gpt\n";
    for (const PLAN_PARTITION &partition : disk.table) {
        table += to_string(partition.number) + " : start=" + to_string(partition.start) +
                 ", size=" + to_string(partition.size) + "\n";
    }
    return Command({"gpt_table", szName, table});
}

string TableScript(const string &szName, const PLAN_DISK &disk)
{
    vector<PLAN_PARTITION> primary;
    string text;
    for (const PLAN_PARTITION &partition : disk.table) {
        if (partition.number <= 4) {
            primary.push_back(partition);
        } else {
            const u64 start = partition.start - GAP;
            text += Command({"sector", szName, to_string(start),
                             TableSector({{1, GAP, partition.size, partition.type}})});
        }
    }
    return Command({"sector", szName, "0", TableSector(primary)}) + text;
}

string DisksScript(const PLAN &plan)
{
    vector<string> names = {"present"};
    string text;
    for (const auto &[szName, disk] : plan.disks) {
        names.push_back(szName);
        if (disk.nWholeMd >= 0) {
            text += Command({"whole", szName, to_string(disk.nWholeMd)});
        }
        if (!disk.table.empty()) {
            text += disk.fGpt ? GptScript(szName, disk) : TableScript(szName, disk);
        }
    }
    return Command(names) + text + "tables_made\n";
}

string ArrayScript(const PLAN_ARRAY &array)
{
    vector<string> words = {"array",
                            to_string(array.nMd),
                            array.fRunning ? "running" : "stopped",
                            "-e",
                            array.szMetadata,
                            "-l" + to_string(array.nLevel),
                            "-n" + to_string(array.members.size() - (array.fSpare ? 1 : 0))};
    if (array.members.size() == 1) {
        words.emplace_back("-f");
    }
    if (array.fSpare) {
        words.emplace_back("-x1");
    }
    if (!array.szName.empty()) {
        words.push_back("--name=" + array.szName);
    }
    for (const string &szMember : array.members) {
        words.push_back("/dev/" + szMember);
    }
    const string szGroup =
        Command({"group", to_string(array.nMd), array.fFull ? "full" : "open",
                 to_string(array.nVolumes), array.fMounted ? "mounted" : "closed"});
    return Command(words) + (array.nVolumes == 0 ? "" : szGroup);
}

string HostsScript(const PLAN &plan)
{
    string text = plan.fUnits ? "hosts_begin\n" : "";
    for (const auto &[szHost, szInfo] : plan.subject.machine.hosts) {
        text += Command(szInfo ? vector<string>{"host", szHost, *szInfo}
                               : vector<string>{"host", szHost});
    }
    return plan.fUnits ? text : "";
}

} // namespace

PLAN PlanMake(std::uint64_t seed, bool fRehearsed)
{
    DICE dice(seed);
    PLAN plan;
    plan.fRehearsed = fRehearsed;
    const bool fDestroys = fRehearsed && seed % DESTROY_EVERY == 0;
    plan.subject = CaseFind(seed, fDestroys);
    ORACLE_MACHINE &machine = plan.subject.machine;
    for (const auto &[szName, table] : machine.disks) {
        plan.disks[szName] = DiskMake(dice, table);
    }
    plan.fUnits = std::any_of(machine.hosts.begin(), machine.hosts.end(), [](const auto &host) {
        return host.first.compare(0, 4, "host") == 0 && host.first != "host0";
    });
    WholeAdd(dice, plan);
    ArraysAdd(dice, plan, fDestroys ? vector<u64>{90} : vector<u64>{0, 60, 90});
    SystemArrayAdd(plan);
    if (fDestroys) {
        DestroyAdd(dice, plan);
    }
    if (!fRehearsed) {
        FaultsAdd(dice, plan);
    }
    return plan;
}

bool PlanDestroys(const PLAN &plan)
{
    return plan.subject.words[0] == DESTROY;
}

std::string PlanScript(const PLAN &plan)
{
    const ORACLE_MACHINE &machine = plan.subject.machine;
    string text = "begin " + to_string(plan.subject.seed) + "\n" + DisksScript(plan);
    for (const PLAN_ARRAY &array : plan.arrays) {
        text += ArrayScript(array);
    }
    text += machine.szConf ? Command({"conf", *machine.szConf}) : "";
    for (const string &szMarker : machine.markers) {
        text += Command({"marker", szMarker});
    }
    for (const string &szProgram : machine.missing) {
        text += Command({"missing", szProgram});
    }
    for (const PLAN_FAULT &fault : plan.faults) {
        text += Command(
            {"fault", fault.szProgram, fault.szPattern, to_string(fault.nExit), fault.szErr});
    }
    vector<string> run = {"run"};
    run.insert(run.end(), plan.subject.words.begin(), plan.subject.words.end());
    text += HostsScript(plan);
    if (plan.fRehearsed) {
        run[0] = "rehearse";
        text += Command(run);
        run[0] = "run";
    }
    return text + Command(run);
}
