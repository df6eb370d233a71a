// SPDX-License-Identifier: MIT
//
// More disks than the texts of a command have room for: whoever is named is named whole. Half a
// partition's path is often the path of a whole disk.
#include "storage_machine.h"

#include <gtest/gtest.h>

#include <set>
#include <sstream>
#include <string>
#include <vector>

namespace
{

// Disks of a machine, and the partitions that its commands may name.
struct MANY_DISKS {
    MACHINE machine;
    std::vector<std::string> disks;
    std::set<std::string> partitions;
};

void DiskAdd(MANY_DISKS &many, const std::string &szDisk)
{
    MachineDiskAdd(many.machine, szDisk);
    many.disks.push_back(szDisk);
    for (const char *const szNumber : {"1", "2", "3"}) {
        many.partitions.insert("/dev/" + szDisk + szNumber);
    }
}

// Every command but those of arrays and duplication is taken for granted.
MANY_DISKS ManyDisks(const std::string &szConf)
{
    MANY_DISKS many = {.machine = MachineWithConf(szConf), .disks = {}, .partitions = {}};
    MachineFile(many.machine, "/.force_clean_all_disk", "");
    MachineTool(many.machine, "/sbin/sfdisk ...", {.nTimes = ANY_TIMES});
    MachineTool(many.machine, "/bin/nurodd ...", {.nTimes = ANY_TIMES});
    MachineTool(many.machine, "/sbin/mdadm -C ...", {.nTimes = ANY_TIMES});
    ShellWatch(many.machine);
    return many;
}

// sda to sdz, then sdaa to sdaf: as many as the mask of the internal disks can name.
MANY_DISKS InternalDisks(int nDisk)
{
    MANY_DISKS many = ManyDisks("max_sys_raid_disks=32\nsupportraid=yes\nusbportcfg=0x0\n"
                                "internalportcfg=0xffffffff\n");
    const std::string szLetters = "abcdefghijklmnopqrstuvwxyz";
    for (int i = 0; i < nDisk; i++) {
        const char chLast = szLetters[static_cast<size_t>(i) % szLetters.size()];
        DiskAdd(many, (i < 26 ? std::string("sd") : std::string("sda")) + chLast);
    }
    return many;
}

// The disks behind the ports, "f+" with the port's own: "f+abc gd" is sdf, sdfa, sdfb, sdfc, sdgd.
std::vector<std::string> NamesOf(const std::string &szUnits)
{
    std::vector<std::string> names;
    std::istringstream units(szUnits);
    for (std::string szUnit; units >> szUnit;) {
        const std::string szPort = "sd" + szUnit.substr(0, 1);
        for (const char chBay : szUnit.substr(1)) {
            names.push_back(chBay == '+' ? szPort : szPort + chBay);
        }
    }
    return names;
}

// Each host tells of one disk.
MANY_DISKS UnitDisks(const std::string &szUnits)
{
    MANY_DISKS many = ManyDisks("max_sys_raid_disks=60\nraidgroup_split_units=60\nsupportraid=yes\n"
                                "support_dual_head=yes\nusbportcfg=0x0\nesataportcfg=0x3ffffff\n");
    for (const std::string &szDisk : NamesOf(szUnits)) {
        DiskAdd(many, szDisk);
        ExpansionUnitAdd(many.machine, "host" + szDisk, "/dev/" + szDisk);
    }
    return many;
}

// What nurodd and mdadm -C are given to work on.
std::vector<std::string> NamedDevices(const RUN_EVENT &event)
{
    const bool fDuplicate = event.argv[0] == "/bin/nurodd";
    const bool fCreate = event.argv.size() > 2 && event.argv[1] == "-C";
    std::vector<std::string> named;
    for (size_t i = fDuplicate ? 1 : 3; (fDuplicate || fCreate) && i < event.argv.size(); i++) {
        if (event.argv[i][0] == '/') {
            named.push_back(event.argv[i]);
        }
    }
    return named;
}

void ExpectPartitionsOnly(const RUN_RESULT &result, const MANY_DISKS &many)
{
    for (const RUN_EVENT &event : result.events) {
        if (event.kind != EVENT_KIND::COMMAND) {
            continue;
        }
        for (const std::string &szDevice : NamedDevices(event)) {
            EXPECT_EQ(many.partitions.count(szDevice), 1U) << szDevice << " of " << event.argv[0];
        }
    }
}

// How many devices each command named, in order.
std::vector<size_t> NamedCounts(const RUN_RESULT &result)
{
    std::vector<size_t> counts;
    for (const RUN_EVENT &event : result.events) {
        if (event.kind == EVENT_KIND::COMMAND && !NamedDevices(event).empty()) {
            counts.push_back(NamedDevices(event).size());
        }
    }
    return counts;
}

std::string NotesOnRoom(const RUN_RESULT &result)
{
    RUN_RESULT notes = {};
    for (const LOG_LINE &line : result.log) {
        if (line.szText.find("left out") != std::string::npos) {
            notes.log.push_back(line);
        }
    }
    return LogText(notes);
}

constexpr char NOTE[] = "<11>arrayctl.cpp:# [Info] ";
constexpr char NO_ROOM[] = " partitions left out, no room in the command\n";

std::string FirstLine(const std::string &szText)
{
    return szText.substr(0, szText.find('\n'));
}

// ---- the duplication tool's command: 511 characters -------------------------------------------

struct DUPLICATE_CASE {
    int nDisk;
    size_t cchCommand;
    size_t nNamed;
    const char *szLast;
    const char *szNote; // "left out of all"
};

constexpr DUPLICATE_CASE DUPLICATE_CASES[] = {
    {23, 490, 46, "/dev/sdw2", ""},         {24, 510, 48, "/dev/sdx2", ""},
    {25, 510, 48, "/dev/sdw2", "2 of 50"},  {26, 510, 48, "/dev/sdv2", "4 of 52"},
    {27, 502, 47, "/dev/sds2", "7 of 54"},  {28, 504, 47, "/dev/sdq2", "9 of 56"},
    {29, 506, 47, "/dev/sdo2", "11 of 58"}, {30, 508, 47, "/dev/sdm2", "13 of 60"},
    {31, 510, 47, "/dev/sdk2", "15 of 62"}, {32, 502, 46, "/dev/sdh2", "18 of 64"},
};

TEST(MemberList, OfTheDuplicationToolHoldsWholePartitionsAndKeepsTheRedirection)
{
    for (const DUPLICATE_CASE &row : DUPLICATE_CASES) {
        SCOPED_TRACE(std::to_string(row.nDisk) + " internal disks");
        MANY_DISKS many = InternalDisks(row.nDisk);
        const RUN_RESULT result = RunEnds(many.machine, {"initsys-dd"}, 0, "");
        ExpectPartitionsOnly(result, many);
        const std::string szCommand = FirstLine(ShellText());
        EXPECT_EQ(szCommand.size(), row.cchCommand);
        EXPECT_EQ(szCommand.substr(0, 22), "/bin/nurodd /dev/sda1 ");
        const std::string szEnd = row.szLast + std::string("  > /dev/null 2>&1");
        EXPECT_EQ(szCommand.substr(szCommand.size() - szEnd.size()), szEnd);
        const auto nDisk = static_cast<size_t>(row.nDisk);
        EXPECT_EQ(NamedCounts(result), (std::vector<size_t>{row.nNamed, nDisk, nDisk}));
        EXPECT_EQ(NotesOnRoom(result),
                  row.szNote[0] == '\0' ? "" : NOTE + std::string(row.szNote) + NO_ROOM);
    }
}

// ---- the lists of members: 511 characters ------------------------------------------------------

struct UNITS_CASE {
    const char *szName;
    const char *szUnits;
    size_t nDisk;
    size_t nNamed;
    const char *szLast; // the list's last disk
    const char *szNote; // "left out of all" of one list
    const char *szNoteDuplicate;
};

constexpr UNITS_CASE UNITS_CASES[] = {
    {"40 names of four letters", "fabcdefghijklmnopqrstuvwxyz gabcdefghijklmn", 40, 40, "sdgn", "",
     "37 of 80"},
    {"46 names of four letters, the last that fit",
     "fabcdefghijklmnopqrstuvwxyz gabcdefghijklmnopqrst", 46, 46, "sdgt", "", "49 of 92"},
    {"48 names of four letters", "fabcdefghijklmnopqrstuvwxyz gabcdefghijklmnopqrstuv", 48, 46,
     "sdgt", "2 of 48", "53 of 96"},
    {"60 names of four letters",
     "fabcdefghijklmnopqrstuvwxyz gabcdefghijklmnopqrstuvwxyz habcdefgh", 60, 46, "sdgt",
     "14 of 60", "77 of 120"},
    {"50 names of three and four letters", "f+abcdefghijklmnopqrstuvwxyz g+abcdefghijklmnopqrstuv",
     50, 46, "sdgr", "4 of 50", "56 of 100"},
    {"48 names: where a long one has no room, a short one may still fit, to the last character",
     "e+ f+abcdefghijklmnopqrstuvwxyz g+abcdefghijklmno h+ i+a j+", 48, 47, "sdj", "1 of 48",
     "52 of 96"},
};

TEST(MemberList, OfTheSystemArraysHoldsWholePartitions)
{
    for (const UNITS_CASE &row : UNITS_CASES) {
        SCOPED_TRACE(row.szName);
        MANY_DISKS many = UnitDisks(row.szUnits);
        ASSERT_EQ(many.disks.size(), row.nDisk);
        const RUN_RESULT result = RunEnds(many.machine, {"initsys"}, 0);
        ExpectPartitionsOnly(result, many);
        EXPECT_EQ(NamedCounts(result), (std::vector<size_t>{row.nNamed, row.nNamed}));
        const std::string szNote = NOTE + std::string(row.szNote) + NO_ROOM;
        EXPECT_EQ(NotesOnRoom(result), row.szNote[0] == '\0' ? "" : szNote + szNote);
        // The slots are those of all disks, so that mdadm refuses a list that is too short.
        const std::string szMissing = row.nDisk == 60 ? "" : " missing";
        EXPECT_NE(ShellText().find("/dev/" + std::string(row.szLast) + "1  " + szMissing),
                  std::string::npos);
        const std::string szFirst = FirstLine(ShellText());
        EXPECT_EQ(szFirst.substr(0, 48), "/sbin/mdadm -C /dev/md0 -e 0.9 -amd -R -l1  -n60");
    }
}

TEST(MemberList, OfTheDuplicationToolIsMadeOfTheListsOfTheArrays)
{
    for (const UNITS_CASE &row : UNITS_CASES) {
        SCOPED_TRACE(row.szName);
        MANY_DISKS many = UnitDisks(row.szUnits);
        const RUN_RESULT result = RunEnds(many.machine, {"initsys-dd"}, 0);
        ExpectPartitionsOnly(result, many);
        const std::string szNote = NOTE + std::string(row.szNote) + NO_ROOM;
        EXPECT_EQ(NotesOnRoom(result), (row.szNote[0] == '\0' ? "" : szNote + szNote) + NOTE +
                                           row.szNoteDuplicate + NO_ROOM);
    }
}

TEST(MemberList, OfTheDataArrayHoldsWholePartitions)
{
    for (const UNITS_CASE &row : UNITS_CASES) {
        SCOPED_TRACE(row.szName);
        MANY_DISKS many = UnitDisks(row.szUnits);
        const RUN_RESULT result =
            RunEnds(many.machine, {"newvol"}, 0, "Creating RAID 5 volume... \n");
        ExpectPartitionsOnly(result, many);
        EXPECT_EQ(NamedCounts(result), std::vector<size_t>{row.nNamed});
        const std::string szNote = NOTE + std::string(row.szNote) + NO_ROOM;
        EXPECT_EQ(NotesOnRoom(result), row.szNote[0] == '\0' ? "" : szNote);
        const std::string szCommand = FirstLine(ShellText());
        const std::string szBegin =
            "/sbin/mdadm -C /dev/md2 -amd -R -l5  -n" + std::to_string(row.nDisk) + " /dev/sd";
        EXPECT_EQ(szCommand.substr(0, szBegin.size()), szBegin);
        const std::string szEnd = "/dev/" + std::string(row.szLast) + "3 > /dev/null 2>&1";
        EXPECT_EQ(szCommand.substr(szCommand.size() - szEnd.size()), szEnd);
    }
}

// 32 internal disks have room in every list.
TEST(MemberList, OfAllInternalDisksIsWhole)
{
    MANY_DISKS many = InternalDisks(32);
    const RUN_RESULT result = RunEnds(many.machine, {"newvol"}, 0);
    ExpectPartitionsOnly(result, many);
    EXPECT_EQ(NamedCounts(result), std::vector<size_t>{32});
    EXPECT_EQ(NotesOnRoom(result), "");
}

} // namespace
