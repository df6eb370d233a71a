// SPDX-License-Identifier: MIT
#include "oracle_machine.h"

#include "oracle_dice.h"
#include "words.h"

#include <algorithm>
#include <cctype>
#include <cstdio>
#include <cstdlib>

namespace
{

using std::string;
using std::to_string;
using std::vector;
using u64 = std::uint64_t;

// The ports a disk can hang on, as the masks of the configuration file know them.
enum ROLE { ROLE_INTERNAL, ROLE_USB, ROLE_ESATA, ROLE_UNIT, ROLE_CACHE, ROLE_NONE };

// What is found on a disk.
enum CONTENT {
    CONTENT_BLANK,
    CONTENT_LAYOUT,
    CONTENT_OFF_BY_ONE,
    CONTENT_FOREIGN,
    CONTENT_ONLY_FIRST,
    CONTENT_ONLY_SECOND,
    CONTENT_UNREADABLE,
    CONTENT_UNLISTED
};

struct PLACE {
    string szName;
    ROLE role;
};

struct SKETCH {
    bool fDualHead = false;
    bool fRaid = false;
    bool fBuiltin = false;
    bool fCrowded = false; // more disks than the buffers of the command lines were made for
    vector<PLACE> places{};
};

// ------------------------------------------------------------------------------------ ports

ROLE RoleMake(DICE &dice, bool fDualHead)
{
    static const vector<ROLE> single = {
        ROLE_INTERNAL, ROLE_INTERNAL, ROLE_INTERNAL, ROLE_INTERNAL, ROLE_INTERNAL, ROLE_INTERNAL,
        ROLE_INTERNAL, ROLE_INTERNAL, ROLE_INTERNAL, ROLE_INTERNAL, ROLE_INTERNAL, ROLE_INTERNAL,
        ROLE_USB,      ROLE_ESATA,    ROLE_UNIT,     ROLE_CACHE,    ROLE_NONE};
    static const vector<ROLE> dual = {ROLE_UNIT, ROLE_UNIT,     ROLE_UNIT, ROLE_UNIT,
                                      ROLE_UNIT, ROLE_INTERNAL, ROLE_USB,  ROLE_ESATA};
    return Pick(dice, fDualHead ? dual : single);
}

string NameMake(DICE &dice, ROLE role)
{
    static const vector<string> odd = {"sdz", "sdaa", "sdab", "sdaf", "sdag", "sdba", "sdga"};
    const string szLetter(1, static_cast<char>('a' + Below(dice, 10)));
    if (role == ROLE_UNIT && Chance(dice, 60)) {
        return "sd" + string(1, static_cast<char>('e' + Below(dice, 4))) + szLetter;
    }
    return Chance(dice, 8) ? Pick(dice, odd) : "sd" + szLetter;
}

void PlacesMake(DICE &dice, SKETCH &sketch)
{
    if (sketch.fCrowded) {
        for (char letter = 'a'; letter <= 'z'; letter++) {
            sketch.places.push_back({string("sd") + letter, ROLE_INTERNAL});
        }
        return;
    }
    const u64 wanted = Chance(dice, 5) ? 0 : 1 + Below(dice, 8);
    while (sketch.places.size() < wanted) {
        const ROLE role = RoleMake(dice, sketch.fDualHead);
        const string szName = NameMake(dice, role);
        const bool fNew = std::none_of(sketch.places.begin(), sketch.places.end(),
                                       [&](const PLACE &place) { return place.szName == szName; });
        if (fNew) {
            sketch.places.push_back({szName, role});
        }
    }
}

u64 RoleBit(const PLACE &place)
{
    const string szLetters = place.szName.substr(2);
    if (place.role == ROLE_ESATA || place.role == ROLE_UNIT) {
        return u64{1} << (szLetters[0] - 'a');
    }
    if (szLetters.size() == 1) {
        return u64{1} << (szLetters[0] - 'a');
    }
    const int index = 26 * (szLetters[0] - 'a' + 1) + szLetters[1] - 'a';
    // The last disk that a mask can name answers to the whole upper half.
    return index == 31 ? u64{1} << 40 : index < 64 ? u64{1} << index : 0;
}

u64 MaskOf(const SKETCH &sketch, const vector<ROLE> &roles)
{
    u64 mask = 0;
    for (const PLACE &place : sketch.places) {
        mask |= std::count(roles.begin(), roles.end(), place.role) != 0 ? RoleBit(place) : 0;
    }
    return mask;
}

void HostsMake(DICE &dice, const SKETCH &sketch, ORACLE_MACHINE &machine)
{
    machine.fScsiHostFolder = !Chance(dice, 3);
    machine.hosts["host0"] = Chance(dice, 50) ? std::nullopt : std::optional<string>("other=1\n");
    machine.hosts["proc"] = "nuro_device_list=/dev/sda,/dev/sdb\n";
    const vector<string> hosts = {"host1", "host10", "host2"};
    std::map<string, string> lists;
    for (const PLACE &place : sketch.places) {
        if (place.role == ROLE_UNIT && !Chance(dice, 4)) {
            string &list = lists[Pick(dice, hosts)];
            list += (list.empty() ? "/dev/" : ",/dev/") + place.szName;
        }
    }
    for (const auto &[szHost, szList] : lists) {
        const bool fTorn = Chance(dice, 4);
        machine.hosts[szHost] = "# port multiplier\nnuro_device_list=\"" + szList +
                                (fTorn ? ";/dev/sda" : "") + "\"\nports=5\n";
    }
}

// ---------------------------------------------------------------------------- configuration

string ConfLine(DICE &dice, const string &szKey, const string &szValue)
{
    switch (Below(dice, 6)) {
    case 0:
        return szKey + " = " + szValue + "\n";
    case 1:
        return szKey + "=" + szValue + "\r\n";
    case 2:
        return " " + szKey + "=\"" + szValue + "\" \n";
    case 3:
        return "=" + szKey + "=" + szValue + "\n";
    default:
        return szKey + "=\"" + szValue + "\"\n";
    }
}

string HexMask(DICE &dice, u64 mask)
{
    string digits;
    for (; mask != 0 || digits.empty(); mask /= 16) {
        digits.insert(digits.begin(), "0123456789abcdef"[mask % 16]);
    }
    return (Chance(dice, 70) ? "0x" : "") + digits;
}

string AnswerText(DICE &dice, bool fYes)
{
    static const vector<string> yes = {"yes", "yes", "yes", "YES", "Yes"};
    static const vector<string> no = {"no", "no", "", "yesss", "no way", "1", "ye"};
    return Pick(dice, fYes ? yes : no);
}

// A key that says no may as well be absent.
string AnswerLine(DICE &dice, const string &szKey, bool fYes)
{
    if (!fYes && Chance(dice, 35)) {
        return "";
    }
    return ConfLine(dice, szKey, AnswerText(dice, fYes));
}

string NumberText(DICE &dice)
{
    static const vector<string> odd = {"", "-1", "abc", "4x", "40", " 3", "99999999999999999999"};
    if (Chance(dice, 8)) {
        return Pick(dice, odd);
    }
    return Chance(dice, 4) ? "0" : to_string(1 + Below(dice, 8));
}

string NumberLine(DICE &dice, const string &szKey, u64 percentMissing)
{
    if (Chance(dice, percentMissing)) {
        return Chance(dice, 80) ? "" : szKey + (Chance(dice, 50) ? "=\n" : "\n");
    }
    return ConfLine(dice, szKey, NumberText(dice));
}

string NoiseLine(DICE &dice)
{
    static const vector<string> noise = {"# maxdisks=1\n",         ";supportraid=no\n",
                                         "unique=\"appliance\"\n", "\n",
                                         " #supportraid=no\n",     "maxdisk=3\n"};
    return Chance(dice, 30) ? Pick(dice, noise) : "";
}

// A number that the split unit's 16 bytes do not hold, or any other.
string SplitLine(DICE &dice)
{
    return Chance(dice, 4) ? "raidgroup_split_units=0000000000000002\n"
                           : NumberLine(dice, "raidgroup_split_units", 50);
}

void ConfMake(DICE &dice, const SKETCH &sketch, ORACLE_MACHINE &machine)
{
    if (Chance(dice, 2)) {
        return;
    }
    vector<string> lines = {
        AnswerLine(dice, "supportraid", sketch.fRaid),
        AnswerLine(dice, "support_buildin_storage", sketch.fBuiltin),
        AnswerLine(dice, "support_dual_head", sketch.fDualHead),
        sketch.fCrowded ? "max_sys_raid_disks=30\n" : NumberLine(dice, "max_sys_raid_disks", 40),
        NumberLine(dice, "maxdisks", 6),
        SplitLine(dice),
    };
    const std::pair<const char *, u64> masks[] = {
        {"usbportcfg", MaskOf(sketch, {ROLE_USB})},
        {"esataportcfg", MaskOf(sketch, {ROLE_ESATA, ROLE_UNIT})},
        {"internalportcfg", MaskOf(sketch, {ROLE_INTERNAL})},
        {"cacheportcfg", MaskOf(sketch, {ROLE_CACHE})},
    };
    for (const auto &[szKey, mask] : masks) {
        const u64 extra = Chance(dice, 5) ? u64{1} << Below(dice, 64) : 0;
        if (!Chance(dice, mask == 0 ? 30 : 2)) {
            lines.push_back(ConfLine(dice, szKey, HexMask(dice, mask | extra)));
        } else if (szKey == masks[0].first && Chance(dice, 90)) {
            lines.push_back("usbportcfg=0x0\n");
        }
    }
    std::shuffle(lines.begin(), lines.end(), dice);
    string text;
    for (const string &szLine : lines) {
        text += NoiseLine(dice) + szLine;
    }
    machine.szConf = text;
}

// ------------------------------------------------------------------------------ superblocks

const string &FixtureRead(const string &szName)
{
    static std::map<string, string> texts;
    string &text = texts[szName];
    if (text.empty()) {
        text = FileText(ORACLE_FIXTURES "/examine/" + szName + ".txt").value_or("");
    }
    if (text.empty()) {
        fprintf(stderr, "no fixture %s\n", szName.c_str());
        abort();
    }
    return text;
}

// The last number of the first word behind the key, where there is one.
void NumberReplace(string &text, const string &szKey, int number)
{
    const size_t word = text.find(szKey) + szKey.size();
    if (text.find(szKey) == string::npos) {
        return;
    }
    const size_t end = text.find_first_of(" \n", word);
    const size_t digits = text.find_last_not_of("0123456789", end - 1) + 1;
    text.replace(digits, end - digits, digits == end ? "" : to_string(number));
}

// A real report, of the array that is wanted here.
string ReportMake(DICE &dice, bool fWholeDisk)
{
    static const vector<int> data = {2, 2, 2, 2, 3, 99, 100, 101, 102, 127};
    static const vector<int> whole = {2, 99, 100, 100, 101, 101};
    static const vector<string> old = {"mirror-0.90", "mirror-0.90", "spare-0.90",
                                       "degraded-raid5-0.90", "level-linear-0.90"};
    static const vector<string> named = {
        "mirror-1.0",          "mirror-1.1",          "mirror-1.2",       "mirror-1.2",
        "level-raid5",         "level-raid10",        "spare-1.0",        "spare-1.2",
        "role-journal",        "role-replacement",    "name-with-umlaut", "name-with-two-colons",
        "name-without-number", "name-without-host",   "container-ddf",    "container-imsm",
        "failed-member",       "name-of-another-host"};
    constexpr char VERSION[] = "0.90.00";
    const int nMd = Pick(dice, fWholeDisk ? whole : data);
    string report = FixtureRead(Pick(dice, Chance(dice, 40) ? old : named));
    NumberReplace(report, "Preferred Minor : ", nMd);
    NumberReplace(report, "           Name : ", nMd);
    const size_t version = report.find(VERSION);
    if (version != string::npos && Chance(dice, 5)) {
        report.replace(version, sizeof(VERSION) - 1, "90"); // and nobody knows what that is
    }
    return report;
}

void ReportAdd(DICE &dice, ORACLE_MACHINE &machine, const string &szDevice, u64 percent)
{
    const string szKey = string(ORACLE_MDADM) + " -E " + szDevice;
    ORACLE_REPLY reply;
    if (Chance(dice, percent)) {
        reply.szOut = ReportMake(dice, isdigit(szDevice.back()) == 0);
    } else {
        reply.szErr = "mdadm: No md superblock detected on " + szDevice + ".\n";
        reply.nExit = 1;
    }
    machine.replies[szKey] = {reply};
}

// ------------------------------------------------------------------------------------- disks

ORACLE_PARTITION Partition(u64 start, u64 size)
{
    return {to_string(start) + "\n", to_string(size) + "\n"};
}

ORACLE_LAYOUT LayoutPick(DICE &dice, const SKETCH &sketch)
{
    vector<ORACLE_LAYOUT> fitting;
    for (const ORACLE_LAYOUT &row : OracleLayouts()) {
        const bool fOwn = (row.raid == 1) == sketch.fRaid && (row.builtin == 1) == sketch.fBuiltin;
        // The oldest layout with RAID is the only one that a machine without it takes for known
        // when it decides about a disk, and for unknown when it looks for an array.
        const bool fOldest = row.version == 1 && row.raid == 1;
        const int weight = fOldest ? 8 : (fOwn ? 4 : 1) * (row.version >= 6 ? 3 : 1);
        fitting.insert(fitting.end(), static_cast<size_t>(weight), row);
    }
    return Pick(dice, fitting);
}

CONTENT ContentMake(DICE &dice)
{
    static const vector<std::pair<CONTENT, int>> weights = {
        {CONTENT_BLANK, 20},     {CONTENT_LAYOUT, 55},    {CONTENT_OFF_BY_ONE, 6},
        {CONTENT_FOREIGN, 7},    {CONTENT_ONLY_FIRST, 4}, {CONTENT_ONLY_SECOND, 3},
        {CONTENT_UNREADABLE, 3}, {CONTENT_UNLISTED, 2}};
    int roll = static_cast<int>(Below(dice, 100));
    for (const auto &[content, weight] : weights) {
        roll -= weight;
        if (roll < 0) {
            return content;
        }
    }
    return CONTENT_BLANK;
}

void SpoilFile(DICE &dice, ORACLE_PARTITION &partition)
{
    std::optional<string> &file = Chance(dice, 50) ? partition.szStart : partition.szSize;
    switch (Below(dice, 3)) {
    case 0:
        file.reset();
        break;
    case 1:
        file = "";
        break;
    default:
        file = "none\n";
        break;
    }
}

ORACLE_PARTITIONS PartitionsMake(DICE &dice, const ORACLE_LAYOUT &row, CONTENT content)
{
    ORACLE_PARTITIONS table = {{1, Partition(row.start1, row.size1)},
                               {2, Partition(row.start2, row.size2)}};
    u64 numbers[] = {row.start1, row.size1, row.start2, row.size2};
    switch (content) {
    case CONTENT_BLANK:
        return {};
    case CONTENT_OFF_BY_ONE:
        numbers[Below(dice, 4)] += Chance(dice, 50) ? 1 : u64(-1);
        return {{1, Partition(numbers[0], numbers[1])}, {2, Partition(numbers[2], numbers[3])}};
    case CONTENT_FOREIGN:
        return {{1, Partition(2048, 1048576)}, {2, Partition(1050624, 204800)}};
    case CONTENT_ONLY_FIRST:
        table.erase(2);
        return table;
    case CONTENT_ONLY_SECOND:
        table.erase(1);
        return table;
    case CONTENT_UNREADABLE:
        SpoilFile(dice, table[Chance(dice, 50) ? 1 : 2]);
        return table;
    default:
        return table;
    }
}

// The partitioner's line of a partition, as a person would expect it from what sysfs shows.
string ListingMake(const string &szDisk, int number, const ORACLE_PARTITION &partition)
{
    const u64 start = std::stoull("0" + partition.szStart.value_or(""));
    const u64 size = std::stoull("0" + partition.szSize.value_or(""));
    return "/dev/" + szDisk + to_string(number) + "  " + to_string(start) + "\t" +
           to_string(start + size - 1) + "  " + to_string(size) + "  fd  Linux raid autodetect\n";
}

string ListingSpoil(DICE &dice, const string &szDisk)
{
    static const vector<string> torn = {"", " 2048 4982527", " 2048 4982527 4980480",
                                        " 2048 4982527 -1 fd"};
    return Chance(dice, 20) ? "\n" : "/dev/" + szDisk + "1" + Pick(dice, torn) + "\n";
}

void ListingsMake(DICE &dice, const string &szDisk, CONTENT content, ORACLE_MACHINE &machine)
{
    const ORACLE_PARTITIONS &table = machine.disks[szDisk];
    for (const int number : {1, 2}) {
        ORACLE_REPLY reply;
        if (table.count(number) != 0) {
            reply.szOut = ListingMake(szDisk, number, table.at(number));
        }
        if (content == CONTENT_UNLISTED && Chance(dice, 70)) {
            reply.szOut = ListingSpoil(dice, szDisk);
        }
        reply.nExit = reply.szOut.empty() ? 1 : 0;
        machine.replies[string(ORACLE_SFDISK) + " -l -uS -N" + to_string(number) + " /dev/" +
                        szDisk] = {reply};
    }
}

void DisksMake(DICE &dice, const SKETCH &sketch, ORACLE_MACHINE &machine)
{
    const ORACLE_LAYOUT common = LayoutPick(dice, sketch);
    const u64 percentArray = Pick(dice, vector<u64>{0, 50, 50, 90});
    for (const PLACE &place : sketch.places) {
        const CONTENT content = ContentMake(dice);
        const ORACLE_LAYOUT row = Chance(dice, 50) ? common : LayoutPick(dice, sketch);
        const string szPath = "/dev/" + place.szName;
        machine.disks[place.szName] = PartitionsMake(dice, row, content);
        ListingsMake(dice, place.szName, content, machine);
        ReportAdd(dice, machine, szPath + "3", percentArray);
        ReportAdd(dice, machine, szPath + "5", percentArray / 5);
        ReportAdd(dice, machine, szPath, 30);
        if (Chance(dice, 20)) {
            ORACLE_REPLY reply;
            reply.szOut = FixtureRead("mbr-only");
            machine.replies[string(ORACLE_MDADM) + " -E " + szPath] = {reply};
        }
    }
    if (Chance(dice, 10)) {
        machine.disks["mmcblk0"] = {};
        machine.disks["loop0"] = {};
    }
}

void SystemArrayMake(DICE &dice, ORACLE_MACHINE &machine)
{
    if (machine.disks.empty() || !Chance(dice, 15)) {
        return;
    }
    for (const auto &[szName, table] : machine.disks) {
        if (machine.md0Members.size() < 3 && Chance(dice, 60)) {
            machine.md0Members.push_back(szName + "1");
        }
    }
    if (Chance(dice, 10)) {
        machine.md0Members.insert(machine.md0Members.begin(), "sdx1");
        machine.md0Members.resize(std::min<size_t>(machine.md0Members.size(), 3));
    }
    std::shuffle(machine.md0Members.begin(), machine.md0Members.end(), dice);
}

// -------------------------------------------------------------------------------- bad tools

ORACLE_REPLY FaultMake(DICE &dice)
{
    static const vector<string> texts = {"", "", "cannot open the disk\n",
                                         "warning: in use\nnothing done\n", "no line end"};
    ORACLE_REPLY reply;
    reply.nExit = Chance(dice, 80) ? static_cast<int>(1 + Below(dice, 5)) : 0;
    reply.szErr = Pick(dice, texts);
    return reply;
}

void DiskFaultAdd(DICE &dice, const string &szName, ORACLE_MACHINE &machine)
{
    const string szSfdisk = string(ORACLE_SFDISK) + " ";
    const string szPath = "/dev/" + szName;
    const vector<string> keys = {
        szSfdisk + "--fast-delete 1:2 " + szPath,
        szSfdisk + "--fast-delete 3:128 " + szPath,
        szSfdisk + "--fast-delete -1 " + szPath,
        szSfdisk + "-M1 " + szPath,
        szSfdisk + "-M1 " + szPath,
        szSfdisk + "-N1 " + szPath,
        szSfdisk + "-N2 " + szPath,
        szSfdisk + "-N3 " + szPath,
        string(ORACLE_MDADM) + " --zero-superblock " + szPath + "1",
        string(ORACLE_MDADM) + " --zero-superblock " + szPath + "2",
    };
    vector<ORACLE_REPLY> &replies = machine.replies[Pick(dice, keys)];
    replies = {FaultMake(dice)};
    if (Chance(dice, 40)) {
        replies.push_back({});
    }
    if (Chance(dice, 20)) {
        std::reverse(replies.begin(), replies.end());
    }
}

void FaultsMake(DICE &dice, ORACLE_MACHINE &machine)
{
    const u64 percent = Pick(dice, vector<u64>{0, 0, 15, 40});
    for (const auto &[szName, table] : machine.disks) {
        if (Chance(dice, percent)) {
            DiskFaultAdd(dice, szName, machine);
        }
    }
    for (const char *szKey : {"/sbin/mdadm -C /dev/md0", "/sbin/mdadm -C /dev/md1",
                              "/sbin/mdadm -C /dev/md2", ORACLE_NURODD}) {
        if (Chance(dice, 12)) {
            machine.replies[szKey] = {FaultMake(dice)};
        }
    }
    const std::pair<const char *, u64> programs[] = {
        {ORACLE_NURODD, 12}, {ORACLE_SFDISK, 1}, {ORACLE_MDADM, 1}};
    for (const auto &[szProgram, percentMissing] : programs) {
        if (Chance(dice, percentMissing)) {
            machine.missing.insert(szProgram);
        }
    }
}

// One child of one disk is killed while the partitioner works for it.
void KillMake(DICE &dice, ORACLE_CASE &made)
{
    if (made.machine.disks.empty() || made.words[0] == "newvol" || !Chance(dice, 4)) {
        return;
    }
    static const vector<string> steps = {
        "-l -uS -N1", "-l -uS -N2", "-M1", "-N1", "-N2", "--fast-delete 1:2", "--fast-delete -1"};
    const auto disk =
        std::next(made.machine.disks.begin(),
                  static_cast<std::ptrdiff_t>(Below(dice, made.machine.disks.size())));
    ORACLE_REPLY reply;
    reply.fKillCaller = true;
    made.machine.replies[string(ORACLE_SFDISK) + " " + Pick(dice, steps) + " /dev/" + disk->first] =
        {reply};
}

void MarkersMake(DICE &dice, ORACLE_MACHINE &machine)
{
    const std::pair<const char *, u64> markers[] = {
        {ORACLE_MARKER_FORCE, 6}, {ORACLE_MARKER_DUAL, 6}, {ORACLE_MARKER_SINGLE, 6},
        {"/tmp/raid.0", 15},      {"/tmp/raid.1", 15},     {"/tmp/raid.5", 15}};
    for (const auto &[szMarker, percent] : markers) {
        if (Chance(dice, percent)) {
            machine.markers.insert(szMarker);
        }
    }
}

ORACLE_WORDS WordsMake(DICE &dice)
{
    static const vector<string> commands = {"initsys",
                                            "initsys",
                                            "initsys",
                                            "initsys-dd",
                                            "initsys-dd",
                                            "newvol",
                                            "newvol",
                                            "enumformatalldisks",
                                            "enumformatalldisks",
                                            "enumformatalldisks_indualhead_install"};
    ORACLE_WORDS words = {Pick(dice, commands)};
    if (Chance(dice, 4)) {
        words.push_back(Chance(dice, 50) ? "2" : "");
    }
    return words;
}

string ShownFile(const string &szPath, const std::optional<string> &szFile)
{
    return "  " + szPath + ": " + (szFile ? Quoted(*szFile) : "missing") + "\n";
}

} // namespace

ORACLE_CASE OracleCaseMake(std::uint64_t seed)
{
    DICE dice(seed);
    ORACLE_CASE made;
    made.seed = seed;
    made.words = WordsMake(dice);
    SKETCH sketch;
    sketch.fDualHead = Chance(dice, 20);
    sketch.fRaid = Chance(dice, 70);
    sketch.fBuiltin = Chance(dice, sketch.fRaid ? 6 : 30);
    sketch.fCrowded = Chance(dice, 1);
    PlacesMake(dice, sketch);
    ConfMake(dice, sketch, made.machine);
    HostsMake(dice, sketch, made.machine);
    DisksMake(dice, sketch, made.machine);
    SystemArrayMake(dice, made.machine);
    MarkersMake(dice, made.machine);
    if (sketch.fCrowded && Chance(dice, 70)) {
        made.machine.markers.insert(ORACLE_MARKER_FORCE);
        made.words = {"initsys-dd"};
    }
    FaultsMake(dice, made.machine);
    KillMake(dice, made);
    return made;
}

std::string OracleCaseText(const ORACLE_CASE &subject)
{
    const ORACLE_MACHINE &machine = subject.machine;
    string text = "  command:";
    for (const string &szWord : subject.words) {
        text += " " + szWord;
    }
    text += "\n" + ShownFile(ORACLE_CONF_PATH, machine.szConf);
    for (const auto &[szName, table] : machine.disks) {
        text += "  disk " + szName + "\n";
        for (const auto &[number, partition] : table) {
            const string szPath = "/sys/block/" + szName + "/" + szName + to_string(number);
            text += ShownFile(szPath + "/start", partition.szStart);
            text += ShownFile(szPath + "/size", partition.szSize);
        }
    }
    for (const string &szMember : machine.md0Members) {
        text += "  member of md0: " + szMember + "\n";
    }
    for (const auto &[szHost, szInfo] : machine.hosts) {
        text += ShownFile("/sys/class/scsi_host/" + szHost + "/nuro_pm_info", szInfo);
    }
    text += machine.fScsiHostFolder ? "" : "  no folder /sys/class/scsi_host\n";
    for (const string &szMarker : machine.markers) {
        text += "  marker " + szMarker + "\n";
    }
    for (const string &szProgram : machine.missing) {
        text += "  missing program " + szProgram + "\n";
    }
    for (const auto &[szKey, replies] : machine.replies) {
        for (const ORACLE_REPLY &reply : replies) {
            text += "  [" + szKey + "] status " + to_string(reply.nExit) + ", out " +
                    Quoted(reply.szOut) + ", err " + Quoted(reply.szErr) +
                    (reply.fKillCaller ? ", kills its caller" : "") + "\n";
        }
    }
    return text;
}
