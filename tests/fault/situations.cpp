// SPDX-License-Identifier: MIT
#include "situations.h"

#include "removal_machine.h"
#include "storage_machine.h"

#include <cerrno>
#include <utility>

namespace
{

using STRINGS = std::vector<std::string>;

constexpr char NO_COMMAND[] = "help";

constexpr const char *TOOLS[] = {"/sbin/mdadm",    "/sbin/sfdisk",   "/sbin/pvs",
                                 "/sbin/lvremove", "/sbin/vgremove", "/sbin/pvremove",
                                 "/bin/umount",    "/bin/nurodd"};

void Add(std::vector<SITUATION> &situations, const std::string &szName, MACHINE machine,
         const STRINGS &words)
{
    const bool fCommand = !words.empty() && words[0] != NO_COMMAND;
    situations.push_back(
        {(fCommand ? words[0] : "usage") + ": " + szName, Relaxed(std::move(machine)), words});
}

// ---- status ------------------------------------------------------------------------------------

MACHINE WithArray(const MACHINE_MD &md)
{
    MACHINE machine = MachineMake();
    MachineMdAdd(machine, md);
    return machine;
}

MACHINE_MEMBER Member(const std::string &szName, int nSlot, const std::string &szState = "in_sync")
{
    return {szName, szState + "\n", nSlot < 0 ? "none\n" : std::to_string(nSlot) + "\n"};
}

std::vector<MACHINE_MEMBER> Members(int nMember)
{
    std::vector<MACHINE_MEMBER> members;
    for (int i = 0; i < nMember; i++) {
        members.push_back(Member(std::string("sd") + static_cast<char>('a' + i) + "3", i));
    }
    return members;
}

void StatusAdd(std::vector<SITUATION> &situations, const std::string &szName, const MACHINE_MD &md)
{
    Add(situations, szName, WithArray(md), {"status", std::to_string(md.nMd)});
}

void StatusSituations(std::vector<SITUATION> &all)
{
    constexpr std::uint64_t BIG = 8ULL << 30U;
    StatusAdd(all, "a mirror", {.nMd = 2, .members = Members(2)});
    StatusAdd(all, "an old mirror",
              {.nMd = 0, .majorVersion = 0, .minorVersion = 90, .members = Members(2)});
    StatusAdd(all, "a big array, whose member size is read from sysfs",
              {.nMd = 2, .level = 5, .nRaidDisks = 3, .arraySize = BIG, .members = Members(3)});
    StatusAdd(all, "a striped array", {.nMd = 2, .level = 0, .members = Members(2)});
    StatusAdd(all, "a linear array", {.nMd = 2, .level = -1, .members = Members(2)});
    StatusAdd(all, "level 6", {.nMd = 2, .level = 6, .nRaidDisks = 4, .members = Members(4)});
    StatusAdd(all, "level 10", {.nMd = 2, .level = 10, .nRaidDisks = 4, .members = Members(4)});
    StatusAdd(all, "a level without a word", {.nMd = 2, .level = 4, .members = Members(3)});
    StatusAdd(all, "eight members", {.nMd = 2, .level = 6, .nRaidDisks = 8, .members = Members(8)});
    StatusAdd(all, "twenty members",
              {.nMd = 2, .level = 6, .nRaidDisks = 20, .members = Members(20)});
    StatusAdd(all, "no member", {.nMd = 2});
    StatusAdd(all, "a failed member",
              {.nMd = 2,
               .level = 5,
               .health = 1,
               .members = {Member("sda3", 0), Member("sdb3", -1, "faulty"), Member("sdc3", 2)}});
    StatusAdd(all, "a crashed array",
              {.nMd = 2,
               .level = 5,
               .health = 2,
               .members = {Member("sda3", 0, "in_sync,error"), Member("sdb3", -1, "faulty")}});
    StatusAdd(all, "a rebuild",
              {.nMd = 2,
               .health = 1,
               .activity = 1,
               .done = 10,
               .total = 100,
               .members = {Member("sda3", 0), Member("sdb3", 1, "spare")}});
    StatusAdd(all, "a rebuild that waits",
              {.nMd = 2, .health = 1, .activity = 1, .total = 100, .members = Members(2)});
    StatusAdd(
        all, "a spare",
        {.nMd = 2, .nSpareDisks = 1, .members = {Member("sda3", 0), Member("sdb3", -1, "spare")}});
    StatusAdd(all, "an array that does not run", {.nMd = 2, .errnoInfo = ENODEV});
    Add(all, "no such array", MachineMake(), {"status", "7"});
    Add(all, "no number", MachineMake(), {"status"});
}

// ---- destroy -----------------------------------------------------------------------------------

std::string Report(const std::string &szUuid)
{
    return "/dev/sdx3:\n          Magic : a92b4efc\n        Version : 1.2\n     Array UUID : " +
           szUuid +
           "\n           Name : box:2\n     Raid Level : raid1\n   Device Role : Active "
           "device 0\n";
}

void Examined(MACHINE &machine, const std::string &szName, const std::string &szUuid)
{
    MachineTool(machine, "/sbin/mdadm -E /dev/" + szName, {.szOut = Report(szUuid)});
}

// md2 on the third partition of so many disks.
MACHINE WithDataArray(int nDisk)
{
    MACHINE machine = MachineMake();
    for (const MACHINE_MEMBER &member : Members(nDisk)) {
        DiskWithPartitionsAdd(machine, member.szName.substr(0, 3), 3);
        Examined(machine, member.szName, UUID_MD2);
    }
    MachineMdAdd(machine, {.nMd = 2, .level = nDisk > 2 ? 5 : 1, .members = Members(nDisk)});
    return machine;
}

void VolumeAdd(MACHINE &machine, const std::string &szRows = "  /dev/md2:vg1:lv1:\n")
{
    MachineTool(machine, {"/sbin/pvs", ANY_REST}, {.szOut = szRows});
}

void MountAdd(MACHINE &machine, const std::string &szDevice, const std::string &szFolder)
{
    machine.files["/proc/mounts"].szText += szDevice + " " + szFolder + " ext4 rw 0 0\n";
    MachineFolder(machine, szFolder);
}

void DestroyLvmSituations(std::vector<SITUATION> &all)
{
    MACHINE machine = WithDataArray(2);
    VolumeAdd(machine);
    Add(all, "a volume on it", machine, {"destroy", "2"});

    MountAdd(machine, "/dev/vg1/lv1s1", "/mnt/one");
    MountAdd(machine, "/dev/vg1/lv1s2", "/mnt/two");
    Add(all, "a volume, mounted twice", machine, {"destroy", "2"});

    MachineRemove(machine, "/proc/mounts");
    Add(all, "a volume, and no table of mounts", machine, {"destroy", "2"});

    machine = WithDataArray(6);
    VolumeAdd(machine);
    MountAdd(machine, "/dev/vg1/lv1s1", "/mnt/one");
    Add(all, "six disks with a volume, mounted", machine, {"destroy", "2"});

    machine = WithDataArray(2);
    VolumeAdd(machine, "  /dev/md3:vg3:lv3:\n  /dev/md2:vg1:lv1:\n  /dev/md2:vg1:lv2:\n");
    for (const char *const szTool : {"/sbin/lvremove", "/sbin/vgremove", "/sbin/pvremove"}) {
        MachineTool(machine, {szTool, ANY_REST}, {.szErr = "it is in use\n", .status = 5});
    }
    Add(all, "volumes that cannot be removed", machine, {"destroy", "2"});
}

void DestroySituations(std::vector<SITUATION> &all)
{
    Add(all, "a mirror", WithDataArray(2), {"destroy", "2"});
    Add(all, "four disks", WithDataArray(4), {"destroy", "2"});
    Add(all, "no such array", MachineMake(), {"destroy", "3"});
    Add(all, "no number", MachineMake(), {"destroy"});
    DestroyLvmSituations(all);

    MACHINE machine = WithDataArray(2);
    MachineTool(machine, STOP_MD2, {.szErr = "mdadm: it is busy\n", .status = 1, .nTimes = 2});
    Add(all, "a stop that fails twice", machine, {"destroy", "2"});

    machine = WithDataArray(2);
    MachineTool(machine, STOP_MD2, {.szErr = "mdadm: it is busy\n", .status = 1});
    Add(all, "a stop that fails", machine, {"destroy", "2"});

    machine = WithDataArray(2);
    MachinePartitionAdd(machine, "sda", 4, 9000000, 1048576);
    MachinePartitionAdd(machine, "sdb", 4, 9000000, 1048576);
    Examined(machine, "sda4", UUID_MD3);
    Examined(machine, "sdb4", UUID_MD3);
    Add(all, "another array on the same disks", machine, {"destroy", "2"});

    machine = WithDataArray(2);
    MachinePartitionAdd(machine, "sda", 4, 9000000, 1048576);
    MachineTool(machine, "/sbin/mdadm -E /dev/sda4",
                {.szOut = "/dev/sda4:\n   MBR Magic : aa55\n"});
    Add(all, "a partition with a boot sector", machine, {"destroy", "2"});
}

// ---- newvol ------------------------------------------------------------------------------------

// Three disks behind an expansion unit beside two internal ones.
MACHINE WithExpansionUnit(const std::string &szMore = "")
{
    MACHINE machine = WithBlankDisks(std::string(CONF_DUAL_HEAD) + szMore,
                                     {"sda", "sdb", "sdga", "sdgb", "sdgc"});
    ExpansionUnitAdd(machine, "host0", "/dev/sdga,/dev/sdgb,/dev/sdgc");
    return machine;
}

void NewvolSituations(std::vector<SITUATION> &all)
{
    const STRINGS words = {"newvol"};
    Add(all, "one disk", WithBlankDisks(CONF_RAID, {"sda"}), words);
    Add(all, "two disks", WithBlankDisks(CONF_RAID, {"sda", "sdb"}), words);
    Add(all, "three disks beside one on USB",
        WithBlankDisks(CONF_RAID, {"sda", "sdb", "sdc", "sde"}), words);
    Add(all, "no RAID", WithBlankDisks(CONF_NO_RAID, {"sda", "sdb"}), words);
    Add(all, "no disk", MachineWithConf(CONF_RAID), words);
    Add(all, "one word too many", MachineWithConf(CONF_RAID), {"newvol", "3"});
    Add(all, "an expansion unit", WithExpansionUnit(), words);
    Add(all, "an expansion unit of which two disks are used",
        WithExpansionUnit("raidgroup_split_units=\"2\"\n"), words);

    MACHINE machine = WithBlankDisks(CONF_RAID, {"sda", "sdb"});
    MachineFile(machine, "/tmp/raid.0", "");
    MachineFile(machine, "/tmp/raid.5", "");
    Add(all, "a level that is asked for", machine, words);

    machine = WithBlankDisks(CONF_RAID, {"sda", "sdb"});
    MachineTool(machine, {"/sbin/mdadm", "-C", ANY_REST}, {.status = 1});
    Add(all, "an array that cannot be made", machine, words);

    machine = WithBlankDisks(CONF_RAID, {"sda", "sdb"});
    MachineTool(machine, {"/sbin/sfdisk", "-N3", ANY_REST}, {.szErr = "no room\n", .status = 1});
    Add(all, "a partition that cannot be made", machine, words);
}

// ---- initsys, initsys-dd -----------------------------------------------------------------------

// An old disk whose data partition belongs to md2.
void UsedDiskAdd(MACHINE &machine, const std::string &szDisk, const DISK_PLACES &places)
{
    DecidedDiskAdd(machine, szDisk, places);
    MachinePartitionAdd(machine, szDisk, 3, 9500000, 2000000);
    MachineTool(machine, "/sbin/mdadm -E /dev/" + szDisk + "3", {.szOut = Examination(2)});
}

MACHINE WithOldDisks()
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    SystemArrayAdd(machine, {{"sda1"}});
    DecidedDiskAdd(machine, "sda", PLACES_8);
    UsedDiskAdd(machine, "sdb", PLACES_6);
    return machine;
}

MACHINE WithSystemDisks()
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    UsedDiskAdd(machine, "sda", PLACES_8);
    UsedDiskAdd(machine, "sdb", PLACES_8);
    return machine;
}

void InitsysDecisionSituations(std::vector<SITUATION> &all)
{
    const STRINGS words = {"initsys"};
    Add(all, "disks that keep their data", WithSystemDisks(), words);
    Add(all, "an old disk in an array is left alone", WithOldDisks(), words);

    MACHINE machine = MachineWithConf(CONF_RAID);
    DecidedDiskAdd(machine, "sda", PLACES_7);
    SystemArrayAdd(machine, {{"sdb1"}});
    DecidedDiskAdd(machine, "sdb", PLACES_8);
    Add(all, "a layout that is renewed", machine, words);

    machine = MachineWithConf(CONF_RAID);
    UsedDiskAdd(machine, "sda", PLACES_8);
    DecidedDiskAdd(machine, "sdb", PLACES_FOREIGN);
    Add(all, "a disk that nobody knows is left alone", machine, words);

    machine = MachineWithConf(CONF_RAID);
    DecidedDiskAdd(machine, "sda", PLACES_FOREIGN);
    DecidedDiskAdd(machine, "sdb", PLACES_FOREIGN);
    Add(all, "only disks that nobody knows", machine, words);

    machine = MachineWithConf(CONF_RAID);
    UsedDiskAdd(machine, "sda", PLACES_6);
    UsedDiskAdd(machine, "sdb", PLACES_7);
    Add(all, "the biggest layout of disks in use", machine, words);

    machine = WithSystemDisks();
    MachineFile(machine, "/.force_clean_all_disk", "");
    Add(all, "all disks are to be wiped", machine, words);
}

void InitsysSituations(std::vector<SITUATION> &all)
{
    const STRINGS words = {"initsys"};
    Add(all, "two blank disks", WithBlankDisks(CONF_RAID, {"sda", "sdb"}), words);
    Add(all, "one blank disk", WithBlankDisks(CONF_RAID, {"sda"}), words);
    Add(all, "no disk", MachineWithConf(CONF_RAID), words);
    Add(all, "more disks than slots",
        WithBlankDisks(std::string(CONF_RAID) + "max_sys_raid_disks=\"2\"\n",
                       {"sda", "sdb", "sdc"}),
        words);
    Add(all, "built-in storage", WithBlankDisks(CONF_BUILDIN, {"sda"}), words);
    Add(all, "an expansion unit", WithExpansionUnit(), words);

    MACHINE machine = MachineMake();
    MachineDiskAdd(machine, "sda");
    Add(all, "no configuration", machine, words);

    machine = WithBlankDisks(CONF_RAID, {"sda", "sdb"});
    MachineTool(
        machine,
        {"/sbin/sfdisk", "-N1", "-uS", "-q", "-f", "-j2048", "-z4980480", "-tfd", "-F", "/dev/sdb"},
        {.szErr = "no room\n", .status = 1});
    Add(all, "a disk that cannot be partitioned", machine, words);
    InitsysDecisionSituations(all);

    const STRINGS duplicated = {"initsys-dd"};
    Add(all, "two blank disks", WithBlankDisks(CONF_RAID, {"sda", "sdb"}), duplicated);
    Add(all, "disks that keep their data", WithSystemDisks(), duplicated);
    machine = WithBlankDisks(CONF_RAID, {"sda"});
    MachineTool(machine, {"/bin/nurodd", ANY_REST}, {.status = 1});
    Add(all, "a duplication that fails", machine, duplicated);
}

// ---- the enumerations --------------------------------------------------------------------------

void EnumerationSituations(std::vector<SITUATION> &all)
{
    for (const char *const szWord :
         {"enumformatalldisks", "enumformatalldisks_indualhead_install"}) {
        const STRINGS words = {szWord};
        Add(all, "three blank disks", WithBlankDisks(CONF_RAID, {"sda", "sdb", "sdc"}), words);
        Add(all, "an expansion unit", WithExpansionUnit(), words);

        MACHINE machine = MachineWithConf(CONF_RAID);
        UsedDiskAdd(machine, "sda", PLACES_8);
        MachineDiskAdd(machine, "sdb");
        Add(all, "a disk that keeps its data and a blank one", machine, words);
        Add(all, "an old disk in an array", WithOldDisks(), words);
    }
    const STRINGS words = {"enumformatalldisks"};
    Add(all, "no disk", MachineWithConf(CONF_RAID), words);

    MACHINE machine = WithSystemDisks();
    MachineFile(machine, "/.force_clean_all_disk", "");
    Add(all, "all disks are to be wiped", machine, words);

    machine = MachineWithConf(CONF_RAID);
    DecidedDiskAdd(machine, "sda", PLACES_FOREIGN);
    Add(all, "a disk that nobody knows", machine, words);
}

} // namespace

MACHINE WithBlankDisks(const std::string &szConf, const STRINGS &disks)
{
    MACHINE machine = MachineWithConf(szConf);
    for (const std::string &szDisk : disks) {
        MachineDiskAdd(machine, szDisk);
    }
    return machine;
}

MACHINE Relaxed(MACHINE machine)
{
    for (TOOL_ROW &row : machine.rows) {
        row.answer.nTimes = row.answer.nTimes == 1 ? ANY_TIMES : row.answer.nTimes;
    }
    MachineTool(machine, {"/sbin/mdadm", "-E", ANY_REST},
                {.szErr = "mdadm: No md superblock detected.\n", .status = 1, .nTimes = ANY_TIMES});
    for (const char *const szTool : TOOLS) {
        MachineTool(machine, {szTool, ANY_REST}, {.nTimes = ANY_TIMES});
    }
    return machine;
}

std::vector<SITUATION> SituationsMake()
{
    std::vector<SITUATION> all;
    StatusSituations(all);
    DestroySituations(all);
    NewvolSituations(all);
    InitsysSituations(all);
    EnumerationSituations(all);
    Add(all, "no command", MachineMake(), {});
    Add(all, "no such command", MachineMake(), {NO_COMMAND});
    return all;
}
