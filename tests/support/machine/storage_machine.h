// SPDX-License-Identifier: MIT
#pragma once

// Models and disks shared by the tests of partitions, membership and the preparing commands.

#include "sandbox.h"

#include <algorithm>
#include <cstdint>
#include <iterator>
#include <string>
#include <vector>

// Four internal disks, two USB ports, RAID.
inline constexpr char CONF_RAID[] = "maxdisks=\"4\"\n"
                                    "supportraid=\"yes\"\n"
                                    "support_buildin_storage=\"no\"\n"
                                    "usbportcfg=\"0x30\"\n"
                                    "esataportcfg=\"0x40\"\n"
                                    "internalportcfg=\"0xf\"\n";

inline constexpr char CONF_NO_RAID[] = "maxdisks=\"4\"\n"
                                       "supportraid=\"no\"\n"
                                       "support_buildin_storage=\"no\"\n"
                                       "usbportcfg=\"0x30\"\n"
                                       "esataportcfg=\"0x40\"\n"
                                       "internalportcfg=\"0xf\"\n";

inline constexpr char CONF_BUILDIN[] = "maxdisks=\"4\"\n"
                                       "supportraid=\"no\"\n"
                                       "support_buildin_storage=\"yes\"\n"
                                       "usbportcfg=\"0x30\"\n"
                                       "esataportcfg=\"0x40\"\n"
                                       "internalportcfg=\"0xf\"\n";

// Disks behind the eSATA port of sdg; the internal ones are not used.
inline constexpr char CONF_DUAL_HEAD[] = "maxdisks=\"4\"\n"
                                         "supportraid=\"yes\"\n"
                                         "support_buildin_storage=\"no\"\n"
                                         "support_dual_head=\"yes\"\n"
                                         "usbportcfg=\"0x30\"\n"
                                         "esataportcfg=\"0x40\"\n"
                                         "internalportcfg=\"0xf\"\n";

// Two eSATA ports, sdf and sdg.
inline constexpr char CONF_TWO_UNITS[] = "supportraid=\"yes\"\n"
                                         "support_buildin_storage=\"no\"\n"
                                         "support_dual_head=\"yes\"\n"
                                         "usbportcfg=\"0x10\"\n"
                                         "esataportcfg=\"0x60\"\n"
                                         "internalportcfg=\"0xf\"\n";

inline void ExpansionUnitAdd(MACHINE &machine, const std::string &szHost,
                             const std::string &szDevices)
{
    MachineFile(machine, "/sys/class/scsi_host/" + szHost + "/nuro_pm_info",
                "nuro_device_list=\"" + szDevices + "\"\n");
}

// Up to 52 disks behind the eSATA ports of sdf and sdg; each host reports ten.
inline std::vector<std::string> TwoUnitsAdd(MACHINE &machine, size_t nDisk)
{
    constexpr size_t LETTERS = 26;
    constexpr size_t DISKS_OF_HOST = 10;
    std::vector<std::string> disks;
    std::vector<std::string> devices(nDisk / DISKS_OF_HOST + 1);
    for (size_t i = 0; i < nDisk; i++) {
        const char ach[] = {'s', 'd', i < LETTERS ? 'f' : 'g',
                            static_cast<char>('a' + i % LETTERS)};
        disks.emplace_back(ach, sizeof(ach));
        MachineDiskAdd(machine, disks.back());
        std::string &szDevices = devices[i / DISKS_OF_HOST];
        szDevices += (szDevices.empty() ? "/dev/" : ",/dev/") + disks.back();
    }
    for (size_t i = 0; i < devices.size(); i++) {
        ExpansionUnitAdd(machine, "host" + std::to_string(i), devices[i]);
    }
    return disks;
}

// ---- disks -------------------------------------------------------------------------------------

// Where partitions 1 and 2 lie.
struct DISK_PLACES {
    std::uint64_t start;
    std::uint64_t size;
    std::uint64_t swapStart;
    std::uint64_t swapSize;
};

inline constexpr DISK_PLACES PLACES_1 = {63, 1574307, 1574370, 787185};
inline constexpr DISK_PLACES PLACES_2 = {63, 4980087, 4980150, 1044225};
inline constexpr DISK_PLACES PLACES_3_NO_RAID = {63, 530082, 530145, 787185};
inline constexpr DISK_PLACES PLACES_6 = {63, 4980087, 4980150, 4192965};
inline constexpr DISK_PLACES PLACES_7 = {256, 4980480, 4980736, 4194304};
inline constexpr DISK_PLACES PLACES_8 = {2048, 4980480, 4982528, 4194304};
inline constexpr DISK_PLACES PLACES_BUILDIN = {256, 2097152, 2097408, 5105569};
inline constexpr DISK_PLACES PLACES_FOREIGN = {2048, 1000000, 1002048, 2000000};

// The disk as sysfs shows it.
inline void PartitionedDiskAdd(MACHINE &machine, const std::string &szDisk,
                               const DISK_PLACES &places)
{
    MachineDiskAdd(machine, szDisk);
    MachinePartitionAdd(machine, szDisk, 1, places.start, places.size);
    MachinePartitionAdd(machine, szDisk, 2, places.swapStart, places.swapSize);
}

inline std::string Listing(const std::string &szDisk, int nPartition, std::uint64_t start,
                           std::uint64_t size)
{
    return "/dev/" + szDisk + std::to_string(nPartition) + "  " + std::to_string(start) + " " +
           std::to_string(start + size - 1) + " " + std::to_string(size) + " fd\n";
}

inline std::string ListingCommand(const std::string &szDisk, int nPartition)
{
    return "/sbin/sfdisk -l -uS -N" + std::to_string(nPartition) + " /dev/" + szDisk;
}

// The partitioner is asked for partitions 1 and 2 and finds neither.
inline void BlankListingsExpect(MACHINE &machine, const std::string &szDisk)
{
    MachineTool(machine, ListingCommand(szDisk, 1));
    MachineTool(machine, ListingCommand(szDisk, 2));
}

inline void ListingsExpect(MACHINE &machine, const std::string &szDisk, const DISK_PLACES &places)
{
    MachineTool(machine, ListingCommand(szDisk, 1),
                {.szOut = Listing(szDisk, 1, places.start, places.size)});
    MachineTool(machine, ListingCommand(szDisk, 2),
                {.szOut = Listing(szDisk, 2, places.swapStart, places.swapSize)});
}

// Disks that a deciding child of the preparing commands will look at.
inline void BlankDiskAdd(MACHINE &machine, const std::string &szDisk)
{
    MachineDiskAdd(machine, szDisk);
    BlankListingsExpect(machine, szDisk);
}

inline void DecidedDiskAdd(MACHINE &machine, const std::string &szDisk, const DISK_PLACES &places)
{
    PartitionedDiskAdd(machine, szDisk, places);
    ListingsExpect(machine, szDisk, places);
}

// The members of the running system array; the first known layout among them decides.
inline void SystemArrayAdd(MACHINE &machine, const std::vector<MACHINE_MEMBER> &members)
{
    MachineMdAdd(machine, {.nMd = 0, .members = members});
}

inline std::string Examination(int nMd)
{
    return "/dev/sdx3:\n        Version : 0.90.00\n           UUID : 1:2:3:4\nPreferred Minor : " +
           std::to_string(nMd) + "\n";
}

// The device's superblock is examined and names the array nMd.
inline void SuperblockExpect(MACHINE &machine, const std::string &szDevice, int nMd, int nTimes = 1)
{
    MachineTool(machine, "/sbin/mdadm -E /dev/" + szDevice,
                {.szOut = Examination(nMd), .nTimes = nTimes});
}

inline void NoSuperblockExpect(MACHINE &machine, const std::string &szDevice, int nTimes = 1)
{
    MachineTool(machine, "/sbin/mdadm -E /dev/" + szDevice, {.status = 1, .nTimes = nTimes});
}

// The options of the partitions made after the clean; by default the newest layout with RAID.
struct SYSTEM_PARTITIONS {
    const char *szStart = "-j2048";
    const char *szSize = "-z4980480";
    const char *szSwapSize = "-z4194304";
    const char *szType = "-tfd";
    const char *szSwapType = "-tfd";
};

inline constexpr char RANGE_SYSTEM[] = "1:2";
inline constexpr char RANGE_ALL[] = "-1";

inline std::vector<std::string> RenewCommands(const std::string &szDisk, const std::string &szRange,
                                              const SYSTEM_PARTITIONS &made = {})
{
    const std::string szPath = "/dev/" + szDisk;
    return {"/sbin/sfdisk --fast-delete " + szRange + " " + szPath, "/sbin/sfdisk -M1 " + szPath,
            "/sbin/sfdisk -M1 " + szPath,
            std::string("/sbin/sfdisk -N1 -uS -q -f ") + made.szStart + " " + made.szSize + " " +
                made.szType + " -F " + szPath,
            std::string("/sbin/sfdisk -N2 -uS -q -f -j0 ") + made.szSwapSize + " " +
                made.szSwapType + " -F " + szPath};
}

inline void RenewExpect(MACHINE &machine, const std::string &szDisk, const std::string &szRange,
                        const SYSTEM_PARTITIONS &made = {})
{
    for (const std::string &szCommand : RenewCommands(szDisk, szRange, made)) {
        MachineTool(machine, szCommand);
    }
}

// ---- the result of a run -----------------------------------------------------------------------

inline bool IsOnDisk(const RUN_EVENT &event, const std::string &szDisk)
{
    if (event.kind != EVENT_KIND::COMMAND || event.argv.size() < 2 || event.argv[1] == "-C" ||
        event.argv[0] == "/bin/nurodd") {
        return false;
    }
    const std::string szPath = "/dev/" + szDisk;
    const std::string &szLast = event.argv.back();
    return szLast.compare(0, szPath.size(), szPath) == 0 &&
           szLast.find_first_not_of("0123456789", szPath.size()) == std::string::npos;
}

// The commands on one disk or its partitions, in order. Those of different disks run in parallel.
inline std::string CommandsOn(const RUN_RESULT &result, const std::string &szDisk)
{
    RUN_RESULT chosen = {};
    std::copy_if(result.events.begin(), result.events.end(), std::back_inserter(chosen.events),
                 [&szDisk](const RUN_EVENT &event) { return IsOnDisk(event, szDisk); });
    return TranscriptText(chosen);
}

// The rest: sleeps, arrays, the duplication tool.
inline std::string CommandsBeside(const RUN_RESULT &result, const std::vector<std::string> &disks)
{
    RUN_RESULT chosen = {};
    for (const RUN_EVENT &event : result.events) {
        if (std::none_of(disks.begin(), disks.end(),
                         [&event](const std::string &szDisk) { return IsOnDisk(event, szDisk); })) {
            chosen.events.push_back(event);
        }
    }
    return TranscriptText(chosen);
}

// The lines of one source file, in order, with process numbers masked.
inline std::string LogOf(const RUN_RESULT &result, const std::string &szFile)
{
    RUN_RESULT chosen = {};
    std::copy_if(result.log.begin(), result.log.end(), std::back_inserter(chosen.log),
                 [&szFile](const LOG_LINE &line) { return line.szText.rfind(szFile, 0) == 0; });
    std::string szText = LogText(chosen);
    const std::string szPid = "pid: ";
    for (size_t i = szText.find(szPid); i != std::string::npos; i = szText.find(szPid, i + 1)) {
        const size_t iNumber = i + szPid.size();
        const size_t iEnd = szText.find_first_not_of("0123456789", iNumber);
        szText.replace(iNumber, iEnd - iNumber, iEnd == iNumber ? "none" : "#");
    }
    return szText;
}

// The lines of error priority, which every log has.
inline std::string LogErrors(const RUN_RESULT &result)
{
    constexpr int PRIORITY_ERROR = 11;
    RUN_RESULT chosen = {};
    std::copy_if(result.log.begin(), result.log.end(), std::back_inserter(chosen.log),
                 [](const LOG_LINE &line) { return line.priority == PRIORITY_ERROR; });
    return LogText(chosen);
}

inline bool HasWord(const TOOL_ROW &row, const std::string &szWord)
{
    return std::find(row.argv.begin(), row.argv.end(), szWord) != row.argv.end();
}

// ---- what the shell is given -------------------------------------------------------------------

inline constexpr char SHELL_RECORD[] = "/tmp/shell.record";

// From now on every command text passed to the shell is recorded before it runs.
inline void ShellWatch(MACHINE &machine)
{
    machine.tools["/bin/sh"] = TOOL_KIND::MISSING; // no stand-in for it
    MachineFile(machine, "/bin/sh",
                std::string("#!/usr/bin/dash\n"
                            "for szText; do :; done\n"
                            "printf '%s\\n' \"$szText\" >> ") +
                    SHELL_RECORD + "\nexec /usr/bin/dash -c \"$szText\"\n",
                0755);
}

// From now on every shell ends by a signal before it runs anything.
inline void ShellKill(MACHINE &machine)
{
    machine.tools["/bin/sh"] = TOOL_KIND::MISSING; // no stand-in for it
    MachineFile(machine, "/bin/sh", "#!/usr/bin/dash\nkill -9 $$\n", 0755);
}

inline std::string ShellText()
{
    return MachineFileRead(SHELL_RECORD).value_or("");
}
