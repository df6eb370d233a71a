// SPDX-License-Identifier: MIT
#include "oracle_model.h"

#include "conf.h"
#include "examine.h"
#include "listing.h"
#include "port.h"

#include <algorithm>
#include <array>
#include <cstdlib>
#include <regex>

namespace
{

using std::optional;
using std::string;
using std::to_string;
using std::vector;
using u32 = std::uint32_t;
using u64 = std::uint64_t;

constexpr int PRIORITY_ERROR = 3;
constexpr int PRIORITY_DEBUG = 7;

constexpr u32 CODE_TOO_SMALL = 0x0100;
constexpr u32 CODE_OPEN = 0x0900;
constexpr u32 CODE_READ = 0x0A00;
constexpr u32 CODE_NOT_FOUND = 0x2000;

constexpr int STATUS_NO_PROGRAM = 127;
constexpr u32 VERSION_NEWEST = 8;
constexpr int CREATE_PAUSE = 3;
constexpr size_t NURODD_ROOM = 511;
constexpr size_t MISSING_ROOM = 255;

enum TYPE { TYPE_NONE = 0, TYPE_WIPE = 1, TYPE_RENEW = 2, TYPE_FOREIGN = 4 };

constexpr const char USAGE[] =
    "usage:\n\tarrayctl destroy <RAID ID> \n\tarrayctl status <RAID ID> "
    "\n\tarrayctl newvol \n\tarrayctl initsys \n\tarrayctl initsys-dd \n";
constexpr const char NO_DISK[] = "No disk to create RAID... \n";

// A process as it stands: what it remembers (a fork copies that) and where its doings go.
struct PROCESS {
    const ORACLE_MACHINE *pMachine = nullptr;
    ORACLE_STRAND *pStrand = nullptr;
    std::set<string> markers{};
    std::map<string, size_t> calls{};
    PORT_MASKS masks{};
    u32 code = 0;
    int fDualHead = -1;
    int fRaid = -1;
    bool fKilled = false;
};

struct MEMBERSHIP {
    bool fUsed = false;
    int nMd = 0;
};

// ---------------------------------------------------------------------------------------- text

// "0x" and the value in upper-case digits, at least `width` of them.
string Hex(u32 value, size_t width)
{
    string digits;
    for (; value != 0 || digits.size() < width; value /= 16) {
        digits.insert(digits.begin(), "0123456789ABCDEF"[value % 16]);
    }
    return "0x" + digits;
}

string Joined(const ORACLE_WORDS &words)
{
    string text;
    for (size_t i = 0; i < words.size(); i++) {
        text += (i == 0 ? "" : " ") + words[i];
    }
    return text;
}

// ------------------------------------------------------------------------- what a process does

void Act(PROCESS &process, ORACLE_ACTION action)
{
    if (!process.fKilled) {
        process.pStrand->actions.push_back(std::move(action));
    }
}

void Log(PROCESS &process, int priority, const string &szText)
{
    Act(process, {ORACLE_KIND::LOG, {}, szText, priority});
}

void LogError(PROCESS &process, const string &szText)
{
    Log(process, PRIORITY_ERROR, szText);
}

ORACLE_REPLY ReplyTake(PROCESS &process, const ORACLE_WORDS &words)
{
    const string szKey = OracleReplyKey(words);
    const auto entry = process.pMachine->replies.find(szKey);
    if (entry == process.pMachine->replies.end() || entry->second.empty()) {
        return {};
    }
    const size_t call = process.calls[szKey]++;
    return entry->second[std::min(call, entry->second.size() - 1)];
}

// Runs a tool by its argument list.
ORACLE_REPLY Run(PROCESS &process, const ORACLE_WORDS &words)
{
    if (process.pMachine->missing.count(words[0]) != 0) {
        ORACLE_REPLY absent;
        absent.nExit = STATUS_NO_PROGRAM;
        return absent;
    }
    Act(process, {ORACLE_KIND::COMMAND, words, "", 0});
    const ORACLE_REPLY reply = ReplyTake(process, words);
    process.fKilled = process.fKilled || reply.fKillCaller;
    return reply;
}

// Runs a tool that changes something; the answer is a wait status.
int RunChange(PROCESS &process, const ORACLE_WORDS &words)
{
    const ORACLE_REPLY reply = Run(process, words);
    if (!reply.szErr.empty()) {
        string text = reply.szErr;
        std::replace(text.begin(), text.end(), '\n', ' ');
        Act(process, {ORACLE_KIND::ERROR_LOG,
                      {},
                      "command=\"" + Joined(words) + "\" Error=\"" + text + "\"",
                      0});
    }
    return reply.nExit * 256;
}

// Runs a text through the shell; the answer is the exit status. A text that is cut before its
// redirection keeps nothing back, not what the shell says itself either.
int RunShell(PROCESS &process, const string &szText)
{
    const ORACLE_WORDS words = OracleShellWords(szText);
    const bool fMissing = process.pMachine->missing.count(words[0]) != 0;
    const bool fRedirected = szText.find("2>&1") != string::npos;
    ORACLE_REPLY reply;
    if (fMissing) {
        reply.nExit = STATUS_NO_PROGRAM;
        reply.szErr = "sh: 1: " + words[0] + ": not found\n";
    } else {
        reply = ReplyTake(process, words);
    }
    Act(process,
        {ORACLE_KIND::SHELL, words, szText, reply.nExit, fMissing, fRedirected ? "" : reply.szErr});
    return reply.nExit;
}

// ------------------------------------------------------------------------------- configuration

// A file that is not there fails the look into it.
CONF_LOOKUP KeyValueGet(PROCESS &process, const optional<string> &szFile, const string &szKey,
                        int cbValue)
{
    if (!szFile) {
        process.code = CODE_OPEN;
        return {-1, ""};
    }
    const CONF_LOOKUP found = ConfLookup(*szFile, szKey, cbValue);
    if (found.result < 1) {
        process.code = found.result < 0 ? CODE_TOO_SMALL : CODE_NOT_FOUND;
    }
    return found;
}

CONF_LOOKUP ConfGet(PROCESS &process, const string &szKey, int cbValue)
{
    return KeyValueGet(process, process.pMachine->szConf, szKey, cbValue);
}

bool ConfIsYes(PROCESS &process, const string &szKey)
{
    return ConfGet(process, szKey, 5).IsYes();
}

bool SupportRaid(PROCESS &process)
{
    if (process.fRaid == -1) {
        process.fRaid = ConfIsYes(process, "supportraid") ? 1 : 0;
    }
    return process.fRaid == 1;
}

bool Builtin(PROCESS &process)
{
    return ConfIsYes(process, "support_buildin_storage");
}

bool DualHeadAsk(PROCESS &process)
{
    if (process.markers.count(ORACLE_MARKER_DUAL) != 0) {
        return true;
    }
    if (process.markers.count(ORACLE_MARKER_SINGLE) != 0) {
        return false;
    }
    constexpr const char KEY[] = "support_dual_head";
    const CONF_LOOKUP found = ConfGet(process, KEY, 512);
    if (found.result < 0) {
        Log(process, PRIORITY_DEBUG,
            string("NLIBCFileGetKeyValue(") + KEY + ") failed [" + Hex(process.code, 4) + " *]");
    }
    process.markers.insert(found.IsYes() ? ORACLE_MARKER_DUAL : ORACLE_MARKER_SINGLE);
    return found.IsYes();
}

bool DualHead(PROCESS &process)
{
    if (process.fDualHead == -1) {
        process.fDualHead = DualHeadAsk(process) ? 1 : 0;
    }
    return process.fDualHead == 1;
}

int SlotCount(PROCESS &process)
{
    const CONF_LOOKUP own = ConfGet(process, "max_sys_raid_disks", 64);
    if (own.result >= 1) {
        return Number32(own.text);
    }
    const CONF_LOOKUP disks = ConfGet(process, "maxdisks", 64);
    if (disks.result >= 1) {
        return Number32(disks.text);
    }
    LogError(process, string("Failed to NLIBCFileGetKeyValue(") + ORACLE_CONF_PATH + ",maxdisks)");
    return 0;
}

int SplitUnits(PROCESS &process)
{
    const CONF_LOOKUP found = ConfGet(process, "raidgroup_split_units", 16);
    return found.result < 1 ? 12 : Number32(found.text);
}

// --------------------------------------------------------------------------------------- ports

// The names that expansion units report; empty when there is none.
string UnitNamesAll(PROCESS &process)
{
    string names;
    if (!process.pMachine->fScsiHostFolder) {
        return names;
    }
    for (const auto &[szHost, szInfo] : process.pMachine->hosts) {
        if (!szHost.starts_with("host")) {
            continue;
        }
        for (const string &szName :
             UnitNames(KeyValueGet(process, szInfo, "nuro_device_list", 256).text)) {
            names += szName + " ";
        }
    }
    return names;
}

bool MasksLoad(PROCESS &process)
{
    if (process.masks[MASK_USB] != 0) {
        return true;
    }
    for (int mask = MASK_USB; mask < MASK_COUNT; mask++) {
        const CONF_LOOKUP found = ConfGet(process, MASK_KEYS[mask], 65);
        if (found.result > 0) {
            process.masks[static_cast<size_t>(mask)] = strtoull(found.text.c_str(), nullptr, 16);
        } else if (mask == MASK_USB) {
            LogError(process, string("Get usbportcfg key from ") + ORACLE_CONF_PATH + " Error");
            return false;
        }
    }
    return true;
}

PORT PortOf(PROCESS &process, const string &szName)
{
    if (!MasksLoad(process)) {
        return PORT_UNKNOWN;
    }
    const bool fAsk = IsOnEsata(process.masks, szName);
    return PortOfName(process.masks, szName, fAsk ? UnitNamesAll(process) : "");
}

// The disks that the commands work on, in byte order.
vector<string> DisksEnum(PROCESS &process)
{
    const PORT wanted = DualHead(process) ? PORT_EUNIT : PORT_INTERNAL;
    vector<string> names;
    for (const auto &[szName, partitions] : process.pMachine->disks) {
        if (szName.starts_with("sd") && PortOf(process, szName) == wanted) {
            names.push_back(szName);
        }
    }
    return names;
}

// ------------------------------------------------------------------------- superblocks, arrays

EXAMINED Examine(PROCESS &process, const string &szDevice)
{
    const EXAMINED examined = ReportRead(Run(process, {ORACLE_MDADM, "-E", szDevice}).szOut);
    if (!examined.problem.empty()) {
        LogError(process, examined.problem);
    }
    return examined;
}

MEMBERSHIP SuperblockMd(PROCESS &process, const string &szDevice)
{
    const EXAMINED block = Examine(process, szDevice);
    if (block.result != 1) {
        return {};
    }
    if (block.mdPath.empty()) {
        LogError(process, "Failed to sscanf [], errno=*");
        return {};
    }
    return {true, Number32(block.mdPath.substr(sizeof("/dev/md") - 1))};
}

// --------------------------------------------------------------------------------- partitions

// A start or size file.
optional<u64> FileSectors(PROCESS &process, const optional<string> &szFile)
{
    const optional<u64> sectors = szFile ? SectorsRead(*szFile) : optional<u64>{};
    if (!sectors) {
        process.code = szFile ? CODE_READ : CODE_OPEN;
    }
    return sectors;
}

// Start and size of a partition, or nothing.
optional<std::pair<u64, u64>> PartitionSectors(PROCESS &process, const string &szDisk, int number)
{
    const auto disk = process.pMachine->disks.find(WithoutDev(szDisk));
    if (disk == process.pMachine->disks.end() || disk->second.count(number) == 0) {
        return {};
    }
    const ORACLE_PARTITION &partition = disk->second.at(number);
    const optional<u64> start = FileSectors(process, partition.szStart);
    const optional<u64> size = start ? FileSectors(process, partition.szSize) : optional<u64>{};
    return size ? optional(std::pair(*start, *size)) : std::nullopt;
}

// The layout version of a disk, or nothing. `szDisk` is logged the way the caller names it.
optional<u32> LayoutCheck(PROCESS &process, const string &szDisk, int raid)
{
    const int builtin = Builtin(process) ? 1 : 0;
    std::array<std::pair<u64, u64>, 2> seen{};
    for (int number = 1; number <= 2; number++) {
        const auto sectors = PartitionSectors(process, szDisk, number);
        if (!sectors) {
            Log(process, PRIORITY_DEBUG,
                szDisk + ": dont contain partition [" + to_string(number) + "]");
            return {};
        }
        seen[static_cast<size_t>(number - 1)] = *sectors;
    }
    for (const ORACLE_LAYOUT &row : OracleLayouts()) {
        if (row.raid == raid && row.builtin == builtin &&
            seen[0] == std::pair(row.start1, row.size1) &&
            seen[1] == std::pair(row.start2, row.size2)) {
            return row.version;
        }
    }
    return {};
}

const ORACLE_LAYOUT *LayoutRow(PROCESS &process, u32 version, int raid)
{
    const u32 wanted = version == 0 ? VERSION_NEWEST : version;
    const int builtin = Builtin(process) ? 1 : 0;
    for (const ORACLE_LAYOUT &row : OracleLayouts()) {
        if (row.version == wanted && row.raid == raid && row.builtin == builtin) {
            return &row;
        }
    }
    return nullptr;
}

MEMBERSHIP UsedByRaid(PROCESS &process, const string &szDisk)
{
    for (const int number : {3, 5}) {
        const MEMBERSHIP membership = SuperblockMd(process, PartitionPath(szDisk, number));
        if (membership.fUsed) {
            return membership;
        }
    }
    if (LayoutCheck(process, szDisk, SupportRaid(process) ? 1 : 0)) {
        return {};
    }
    const MEMBERSHIP whole = SuperblockMd(process, szDisk);
    return whole.fUsed && whole.nMd >= 101 ? whole : MEMBERSHIP{};
}

// The version of the running system array's members; nothing when there is no such array.
optional<u32> VersionOfSystemArray(PROCESS &process)
{
    if (process.pMachine->md0Members.empty()) {
        return {};
    }
    for (const string &szMember : process.pMachine->md0Members) {
        const string szName = szMember.substr(0, szMember.size() - 1);
        if (const auto version = LayoutCheck(process, szName, 1)) {
            return version;
        }
    }
    return VERSION_NEWEST;
}

// The version that new system partitions get.
u32 VersionGet(PROCESS &process, bool fBiggest)
{
    if (const auto running = VersionOfSystemArray(process)) {
        return *running;
    }
    const bool fRaid = SupportRaid(process);
    u32 biggest = 0;
    for (const string &szName : DisksEnum(process)) {
        const string szPath = "/dev/" + szName;
        const auto version = LayoutCheck(process, szPath, fRaid ? 1 : 0);
        if (!version) {
            continue;
        }
        if (fRaid) {
            const MEMBERSHIP membership = UsedByRaid(process, szPath);
            if (!membership.fUsed || membership.nMd > 99) {
                continue;
            }
        }
        if (!fBiggest) {
            return *version;
        }
        biggest = std::max(biggest, *version);
    }
    if (biggest == 0) {
        return VERSION_NEWEST;
    }
    LogError(process, "Choose biggest partition layout version " + to_string(biggest) + ".");
    return biggest;
}

int TableAdd(PROCESS &process, const string &szDisk)
{
    const int result = RunChange(process, {ORACLE_SFDISK, "-M1", szDisk});
    if (result != 0) {
        LogError(process,
                 "Failed to add ms-dos signature to " + szDisk + ", err=" + to_string(result));
    }
    return result;
}

void Clean(PROCESS &process, const string &szDisk, const string &szRange)
{
    const ORACLE_WORDS words = {ORACLE_SFDISK, "--fast-delete", szRange, szDisk};
    if (RunChange(process, words) != 0) {
        Log(process, PRIORITY_DEBUG, "Failed to do '" + Joined(words) + "'");
    }
    (void)TableAdd(process, szDisk);
}

string NumberOption(const char *szOption, u64 value)
{
    return szOption + to_string(value);
}

bool CommandOrLog(PROCESS &process, const ORACLE_WORDS &words)
{
    const int result = RunChange(process, words);
    if (result != 0) {
        LogError(process, "Failed to [" + Joined(words) + "], err=" + to_string(result));
    }
    return result == 0;
}

const ORACLE_LAYOUT *RowOrLog(PROCESS &process, u32 version, bool fRaid)
{
    const ORACLE_LAYOUT *pRow = LayoutRow(process, version, fRaid ? 1 : 0);
    if (pRow == nullptr) {
        LogError(process, "Failed to get partition layout: version=" + to_string(version));
    }
    return pRow;
}

bool DataCreate(PROCESS &process, const string &szDisk)
{
    const bool fRaid = SupportRaid(process);
    const ORACLE_LAYOUT *pRow = RowOrLog(process, 0, fRaid);
    return pRow != nullptr && CommandOrLog(process, {ORACLE_SFDISK, "-N3", "", "-uS", "-q", "-f",
                                                     NumberOption("-j", pRow->dataGap), "-z-1",
                                                     fRaid ? "-tfd" : "-t83", "-F", szDisk});
}

bool SystemCreate(PROCESS &process, const string &szDisk, u32 version)
{
    const bool fRaid = SupportRaid(process);
    const ORACLE_LAYOUT *pRow = RowOrLog(process, version, fRaid);
    if (pRow == nullptr) {
        return false;
    }
    const string szFailed = "Failed to partition disk " + szDisk + ", err=";
    if (TableAdd(process, szDisk) != 0) {
        LogError(process, szFailed + "255");
        return false;
    }
    const int first = RunChange(
        process, {ORACLE_SFDISK, "-N1", "-uS", "-q", "-f", NumberOption("-j", pRow->start1),
                  NumberOption("-z", pRow->size1), fRaid ? "-tfd" : "-t83", "-F", szDisk});
    if (first != 0) {
        LogError(process, szFailed + to_string(first));
        return false;
    }
    return CommandOrLog(process,
                        {ORACLE_SFDISK, "-N2", "-uS", "-q", "-f", "-j0",
                         NumberOption("-z", pRow->size2), fRaid ? "-tfd" : "-t82", "-F", szDisk});
}

// Whether the partitioner lists the partition, with a size that is not all ones.
bool Listed(PROCESS &process, const string &szDisk, int number)
{
    const ORACLE_REPLY reply = Run(process, {ORACLE_SFDISK, "-l", "-uS",
                                             NumberOption("-N", static_cast<u64>(number)), szDisk});
    const optional<LISTED> listed = ListingRead(reply.szOut);
    return listed && listed->nSectors != -1;
}

// ---------------------------------------------------------------------- what becomes of a disk

TYPE FormatType(PROCESS &process, const string &szName, u32 wanted)
{
    const string szDisk = "/dev/" + szName;
    if (process.markers.count(ORACLE_MARKER_FORCE) != 0) {
        return TYPE_WIPE;
    }
    const bool fFirst = Listed(process, szDisk, 1);
    const bool fSecond = Listed(process, szDisk, 2);
    if (!fFirst && !fSecond) {
        return TYPE_WIPE;
    }
    const auto version = LayoutCheck(process, szDisk, 1);
    if (!version) {
        return TYPE_FOREIGN;
    }
    if (*version == wanted) {
        return wanted == 1 ? TYPE_WIPE : TYPE_RENEW;
    }
    if (wanted == 8 && *version == 7) {
        return TYPE_RENEW;
    }
    return UsedByRaid(process, szDisk).fUsed ? TYPE_NONE : TYPE_WIPE;
}

// A phase has one strand for each disk and, behind them, one for the parent.
ORACLE_PHASE &PhaseBegin(ORACLE_ANSWER &answer, PROCESS &parent, const vector<string> &names)
{
    ORACLE_PHASE &phase = answer.phases.emplace_back();
    for (const string &szName : names) {
        phase.push_back({szName, {}});
    }
    phase.push_back({"", {}});
    parent.pStrand = &phase.back();
    return phase;
}

void LogKilled(PROCESS &parent, const string &szName)
{
    LogError(parent, "Child exit not normally, pid: * disk: " + szName);
}

vector<TYPE> Decide(ORACLE_ANSWER &answer, PROCESS &parent, const vector<string> &names, u32 wanted)
{
    ORACLE_PHASE &phase = PhaseBegin(answer, parent, names);
    vector<TYPE> types;
    for (size_t i = 0; i < names.size(); i++) {
        PROCESS child = parent;
        child.pStrand = &phase[i];
        const TYPE type = FormatType(child, names[i], wanted);
        if (type == TYPE_NONE) {
            LogError(child, "Failed to get format type");
        }
        if (child.fKilled) {
            LogKilled(parent, names[i]);
        }
        types.push_back(child.fKilled ? TYPE_NONE : type);
    }
    return types;
}

// Whether the disk has fresh system partitions when its child ends.
bool Prepare(PROCESS &child, const string &szName, TYPE type, u32 version)
{
    const string szDisk = "/dev/" + szName;
    Clean(child, szDisk, type == TYPE_WIPE ? "-1" : "1:2");
    if (SystemCreate(child, szDisk, version)) {
        return true;
    }
    LogError(child, "Failed to create system partition of " + szDisk +
                        ", newlayout=" + to_string(version) + ", errno=" + Hex(child.code, 1));
    return false;
}

struct ACCEPTED {
    int nDisks = 0;
    string szSystem{};
    string szSwap{};
};

void Accept(PROCESS &parent, const string &szName, int slots, ACCEPTED &accepted)
{
    const string szFirst = PartitionPath(szName, 1);
    const string szSecond = PartitionPath(szName, 2);
    if (accepted.nDisks >= slots) {
        (void)RunChange(parent, {ORACLE_MDADM, "--zero-superblock", szFirst});
        (void)RunChange(parent, {ORACLE_MDADM, "--zero-superblock", szSecond});
        return;
    }
    accepted.nDisks++;
    accepted.szSystem += szFirst + " ";
    accepted.szSwap += szSecond + " ";
}

ACCEPTED PrepareAll(ORACLE_ANSWER &answer, PROCESS &parent, const vector<string> &names,
                    const vector<TYPE> &types, u32 version, int slots)
{
    const bool fAnyRenew = std::count(types.begin(), types.end(), TYPE_RENEW) != 0;
    ORACLE_PHASE &phase = PhaseBegin(answer, parent, names);
    const PROCESS origin = parent; // every child is forked before the first is waited for
    ACCEPTED accepted;
    for (size_t i = 0; i < names.size(); i++) {
        if (types[i] == TYPE_NONE || (fAnyRenew && types[i] == TYPE_FOREIGN)) {
            continue;
        }
        PROCESS child = origin;
        child.pStrand = &phase[i];
        const bool fPrepared = Prepare(child, names[i], types[i], version);
        if (child.fKilled) {
            LogKilled(parent, names[i]);
        } else if (fPrepared) {
            Accept(parent, names[i], slots, accepted);
        }
    }
    return accepted;
}

// The members that still fit, each of them whole. Returns how many do not.
int MembersTake(const string &szMembers, size_t room, string &szText)
{
    int nLeftOut = 0;
    for (const string &szPartition : Words(szMembers, " ")) {
        if (szText.size() + szPartition.size() + 1 > room) {
            nLeftOut++;
        } else {
            szText += szPartition + " ";
        }
    }
    return nLeftOut;
}

void Duplicate(PROCESS &parent, const ACCEPTED &accepted, string &szOut)
{
    const string szSilent = " > /dev/null 2>&1";
    const size_t room = NURODD_ROOM - szSilent.size();
    string szCommand = string(ORACLE_NURODD) + " ";
    int nLeftOut = MembersTake(accepted.szSystem, room, szCommand);
    szCommand += szCommand.size() < room ? " " : "";
    nLeftOut += MembersTake(accepted.szSwap, room, szCommand);
    if (nLeftOut > 0) {
        LogError(parent, "[Info] " + to_string(nLeftOut) + " of " + to_string(2 * accepted.nDisks) +
                             " partitions left out, no room in the command");
    }
    if (RunShell(parent, szCommand + szSilent) != 0) {
        szOut += "system init with nurodd failed\n";
    }
}

void SystemArrayCreate(PROCESS &parent, const string &szMd, int nDisks, int slots,
                       const string &szMembers)
{
    string szMissing;
    for (int slot = nDisks; slot < slots && szMissing.size() < MISSING_ROOM; slot++) {
        szMissing += " missing";
    }
    const string szCommand = string(ORACLE_MDADM) + " -C " + szMd + " -e 0.9 -amd -R -l1 " +
                             (nDisks == 1 ? "-f" : "") + " -n" + to_string(slots) + " " +
                             szMembers + " " + szMissing.substr(0, MISSING_ROOM) +
                             "> /dev/null 2>&1";
    Act(parent, {ORACLE_KIND::SLEEP, {}, "", CREATE_PAUSE});
    if (RunShell(parent, szCommand) != 0) {
        LogError(parent, "Failed to create RAID '" + szMd + "' on '" + szMembers + "' ");
        LogError(parent, "szCmd=[" + szCommand + "]");
    }
}

// ------------------------------------------------------------------------------------ commands

int InitSystem(ORACLE_ANSWER &answer, PROCESS &parent, bool fDuplicate)
{
    const int slots = SlotCount(parent);
    const u32 version = VersionGet(parent, true);
    const vector<string> names = DisksEnum(parent);
    const vector<TYPE> types = Decide(answer, parent, names, version);
    const ACCEPTED accepted = PrepareAll(answer, parent, names, types, version, slots);
    (void)PhaseBegin(answer, parent, {});
    if (fDuplicate) {
        Duplicate(parent, accepted, answer.szOut);
    }
    if (accepted.nDisks == 0) {
        LogError(parent, "No disk to create system and swap partition, initsys fail!");
        return 1;
    }
    SystemArrayCreate(parent, "/dev/md0", accepted.nDisks, slots, accepted.szSystem);
    SystemArrayCreate(parent, "/dev/md1", accepted.nDisks, slots, accepted.szSwap);
    LogError(parent, "system inited on [" + accepted.szSystem + "], [" + accepted.szSwap + "]");
    return 0;
}

int LevelChoose(const PROCESS &process, int nDisks)
{
    for (const int level : {0, 1, 5}) {
        if (process.markers.count("/tmp/raid." + to_string(level)) != 0) {
            return level;
        }
    }
    return nDisks > 2 ? 5 : 1;
}

int DataArrayCreate(PROCESS &process, int nDisks, const string &szMembers, string &szOut)
{
    const int level = LevelChoose(process, nDisks);
    szOut += "Creating RAID " + to_string(level) + " volume... \n";
    const int status =
        RunShell(process, string(ORACLE_MDADM) + " -C /dev/md2 -amd -R -l" + to_string(level) +
                              " " + (nDisks == 1 ? "-f" : "") + " -n" + to_string(nDisks) + " " +
                              szMembers + "> /dev/null 2>&1");
    if (status != 0) {
        LogError(process, "Failed to create RAID '/dev/md2' on '" + szMembers +
                              "', errno=" + to_string(status));
    }
    return status == 0 ? 0 : 1;
}

int NewVolume(ORACLE_ANSWER &answer, PROCESS &process, size_t nWords)
{
    if (nWords != 1) {
        answer.szOut = USAGE;
        return 1;
    }
    int nDisks = 0;
    string szMembers;
    for (const string &szName : DisksEnum(process)) {
        if (DualHead(process) && SplitUnits(process) <= nDisks) {
            LogError(process,
                     "Get " + to_string(nDisks) + " disks, more than raid group split unit");
            break;
        }
        nDisks++;
        const string szDisk = "/dev/" + szName;
        Clean(process, szDisk, "3:128");
        if (!DataCreate(process, szDisk)) {
            LogError(process, "Failed to create data partition of " + szDisk +
                                  ", errno=" + Hex(process.code, 1));
            return 1;
        }
        szMembers += PartitionPath(szName, 3) + " ";
    }
    if (nDisks == 0) {
        answer.szOut = NO_DISK;
        return 1;
    }
    return DataArrayCreate(process, nDisks, szMembers, answer.szOut);
}

int FormatAllEnum(ORACLE_ANSWER &answer, PROCESS &parent, bool fDualHeadInstall)
{
    const vector<string> names = DisksEnum(parent);
    const u32 version = VersionGet(parent, false);
    const vector<TYPE> types = Decide(answer, parent, names, version);
    (void)PhaseBegin(answer, parent, {});
    const bool fAnyRenew = std::count(types.begin(), types.end(), TYPE_RENEW) != 0;
    int nPrinted = 0;
    for (size_t i = 0; i < names.size(); i++) {
        if (!fAnyRenew || types[i] == TYPE_WIPE) {
            answer.szOut += to_string(DiskIndex(names[i]) + 1) + " ";
            nPrinted++;
        }
    }
    if (fDualHeadInstall && DualHead(parent) && nPrinted != 0) {
        answer.szOut = "all";
    }
    return nPrinted;
}

int Dispatch(ORACLE_ANSWER &answer, PROCESS &parent, const ORACLE_WORDS &words)
{
    if (words[0] == "newvol") {
        return NewVolume(answer, parent, words.size());
    }
    if (words[0] == "initsys" || words[0] == "initsys-dd") {
        return InitSystem(answer, parent, words[0] == "initsys-dd");
    }
    return FormatAllEnum(answer, parent, words[0] == "enumformatalldisks_indualhead_install");
}

} // namespace

std::span<const ORACLE_LAYOUT> OracleLayouts()
{
    static constexpr ORACLE_LAYOUT LAYOUTS[] = {
        {1, 0, 0, 63, 273042, 273105, 787185, 273042},
        {2, 0, 0, 63, 4980087, 4980150, 1044225, 257040},
        {3, 0, 0, 63, 530082, 530145, 787185, 16002},
        {5, 0, 0, 63, 722862, 722925, 594405, 16002},
        {6, 0, 0, 63, 4980087, 4980150, 4192965, 257040},
        {7, 0, 0, 256, 4980480, 4980736, 4194304, 262144},
        {8, 0, 0, 2048, 4980480, 4982528, 4194304, 260352},
        {1, 1, 0, 63, 1574307, 1574370, 787185, 273105},
        {2, 1, 0, 63, 4980087, 4980150, 1044225, 257040},
        {6, 1, 0, 63, 4980087, 4980150, 4192965, 257040},
        {7, 1, 0, 256, 4980480, 4980736, 4194304, 262144},
        {8, 1, 0, 2048, 4980480, 4982528, 4194304, 260352},
        {7, 0, 1, 256, 2097152, 2097408, 5105569, 524288},
        {8, 0, 1, 256, 2097152, 2097408, 5105569, 524288},
    };
    return LAYOUTS;
}

std::string OracleReplyKey(const ORACLE_WORDS &words)
{
    if (words[0] == ORACLE_NURODD) {
        return words[0];
    }
    if (words.size() > 3 && words[1] == "-C") {
        return Joined({words[0], words[1], words[2]});
    }
    if (words.size() > 2 && words[1].starts_with("-N")) {
        return Joined({words[0], words[1], words.back()});
    }
    return Joined(words);
}

ORACLE_WORDS OracleShellWords(const std::string &szText)
{
    return Words(szText.substr(0, szText.find('>')), " ");
}

ORACLE_ANSWER OracleAnswer(const ORACLE_MACHINE &machine, const ORACLE_WORDS &words)
{
    ORACLE_ANSWER answer;
    answer.phases.reserve(4); // strands are pointed to while phases are added
    PROCESS parent;
    parent.pMachine = &machine;
    parent.markers = machine.markers;
    (void)PhaseBegin(answer, parent, {});
    answer.nStatus = Dispatch(answer, parent, words) & 0xff;
    answer.markers = parent.markers;
    return answer;
}

std::string OracleLineMask(const std::string &szLine)
{
    static const std::regex prefix("^[A-Za-z0-9_]+\\.cpp:[0-9#]+ ");
    static const std::regex origin("(failed \\[0x[0-9A-F]{4}) [A-Za-z0-9_]+\\.cpp:[0-9#]+\\]$");
    static const std::regex pid("pid: -?[0-9]+ ");
    static const std::regex reason("^(Failed to sscanf .*, errno=).*$");
    string line = szLine;
    if (!std::regex_search(line, prefix)) {
        return "no source file and line before: " + line;
    }
    line = std::regex_replace(line, prefix, "", std::regex_constants::format_first_only);
    line = std::regex_replace(line, origin, "$1 *]");
    line = std::regex_replace(line, pid, "pid: * ");
    return std::regex_replace(line, reason, "$1*");
}

std::string OracleErrorLineMask(const std::string &szLine)
{
    static const std::regex stamp("^[A-Z][a-z]{2} [0-9]{2} [0-9]{2}:[0-9]{2}:[0-9]{2} ");
    if (!std::regex_search(szLine, stamp)) {
        return "no time stamp before: " + szLine;
    }
    return std::regex_replace(szLine, stamp, "", std::regex_constants::format_first_only);
}
