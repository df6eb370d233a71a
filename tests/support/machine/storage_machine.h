// SPDX-License-Identifier: MIT
#pragma once

// Models, disks and commands shared by the tests of partitions, membership and the preparing
// commands.

#include "steps.h"

#include <algorithm>
#include <cstdint>
#include <iterator>
#include <map>
#include <string>
#include <vector>

inline const std::string CONF_PORTS = "maxdisks=\"4\"\n"
                                      "usbportcfg=\"0x30\"\n"
                                      "esataportcfg=\"0x40\"\n"
                                      "internalportcfg=\"0xf\"\n";

// Four internal disks, two USB ports, RAID.
inline const std::string CONF_RAID = CONF_PORTS + "supportraid=\"yes\"\n"
                                                  "support_buildin_storage=\"no\"\n";
inline const std::string CONF_NO_RAID = CONF_PORTS + "supportraid=\"no\"\n"
                                                     "support_buildin_storage=\"no\"\n";
inline const std::string CONF_BUILDIN = CONF_PORTS + "supportraid=\"no\"\n"
                                                     "support_buildin_storage=\"yes\"\n";
// Disks behind the eSATA port of sdg; the internal ones are not used.
inline const std::string CONF_DUAL_HEAD = CONF_RAID + "support_dual_head=\"yes\"\n";

inline void ExpansionUnitAdd(MACHINE &machine, const std::string &szHost,
                             const std::string &szDevices)
{
    MachineFile(machine, "/sys/class/scsi_host/" + szHost + "/nuro_pm_info",
                "nuro_device_list=\"" + szDevices + "\"\n");
}

// ---- disks -------------------------------------------------------------------------------------

// Where partitions 1 and 2 lie. One without a size is not there.
struct DISK_PLACES {
    std::uint64_t start = 0;
    std::uint64_t size = 0;
    std::uint64_t swapStart = 0;
    std::uint64_t swapSize = 0;
};

inline constexpr DISK_PLACES BLANK = {};
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
    if (places.size != 0) {
        MachinePartitionAdd(machine, szDisk, 1, places.start, places.size);
    }
    if (places.swapSize != 0) {
        MachinePartitionAdd(machine, szDisk, 2, places.swapStart, places.swapSize);
    }
}

inline MACHINE MachineOfDisks(const std::map<std::string, DISK_PLACES> &disks,
                              const std::string &szConf = CONF_RAID)
{
    MACHINE machine = MachineWithConf(szConf);
    for (const auto &[szDisk, places] : disks) {
        PartitionedDiskAdd(machine, szDisk, places);
    }
    return machine;
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

// ---- steps on a disk, with @ in place of its name ----------------------------------------------

inline STEPS StepsOn(const std::string &szDisk, STEPS steps)
{
    for (STEP &step : steps) {
        for (std::string *const pText : {&step.szText, &step.answer.szOut}) {
            for (size_t i = pText->find('@'); i != std::string::npos; i = pText->find('@', i)) {
                pText->replace(i, 1, szDisk);
            }
        }
    }
    return steps;
}

// Whether it is blank or what it holds is asked of the partitioner.
inline STEPS Listed(const DISK_PLACES &places)
{
    return {{ListingCommand("@", 1),
             {.szOut = places.size == 0 ? "" : Listing("@", 1, places.start, places.size)}},
            {ListingCommand("@", 2),
             {.szOut =
                  places.swapSize == 0 ? "" : Listing("@", 2, places.swapStart, places.swapSize)}}};
}

inline STEPS Cleaned(const std::string &szRange)
{
    return {{"/sbin/sfdisk --fast-delete " + szRange + " /dev/@"}, {"/sbin/sfdisk -M1 /dev/@"}};
}

inline STEPS Made(const std::string &szSystem, const std::string &szSwap)
{
    return {{"/sbin/sfdisk -M1 /dev/@"},
            {"/sbin/sfdisk -N1 -uS -q -f " + szSystem + " -F /dev/@"},
            {"/sbin/sfdisk -N2 -uS -q -f " + szSwap + " -F /dev/@"}};
}

inline constexpr char RANGE_SYSTEM[] = "1:2";
inline constexpr char RANGE_DATA[] = "3:128";
inline constexpr char RANGE_ALL[] = "-1";

// The layouts of RAID machines, of those without, and of those with a built-in storage.
inline const STEPS MADE_1 = Made("-j63 -z1574307 -tfd", "-j0 -z787185 -tfd");
inline const STEPS MADE_2 = Made("-j63 -z4980087 -tfd", "-j0 -z1044225 -tfd");
inline const STEPS MADE_6 = Made("-j63 -z4980087 -tfd", "-j0 -z4192965 -tfd");
inline const STEPS MADE_7 = Made("-j256 -z4980480 -tfd", "-j0 -z4194304 -tfd");
inline const STEPS MADE_8 = Made("-j2048 -z4980480 -tfd", "-j0 -z4194304 -tfd");
inline const STEPS MADE_3_NO_RAID = Made("-j63 -z530082 -t83", "-j0 -z787185 -t82");
inline const STEPS MADE_8_NO_RAID = Made("-j2048 -z4980480 -t83", "-j0 -z4194304 -t82");
inline const STEPS MADE_BUILDIN = Made("-j256 -z2097152 -t83", "-j0 -z5105569 -t82");

// A disk whose partitions are renewed in the newest layout.
inline void RenewExpect(MACHINE &machine, const std::string &szDisk, const std::string &szRange)
{
    StepsExpect(machine, StepsOn(szDisk, Cleaned(szRange) + MADE_8));
}

// A disk that a deciding child of the preparing commands will look at.
inline void DecidedDiskAdd(MACHINE &machine, const std::string &szDisk, const DISK_PLACES &places)
{
    PartitionedDiskAdd(machine, szDisk, places);
    StepsExpect(machine, StepsOn(szDisk, Listed(places)));
}

inline void BlankDiskAdd(MACHINE &machine, const std::string &szDisk)
{
    DecidedDiskAdd(machine, szDisk, BLANK);
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

inline std::string ProcessNumbersMask(std::string szText)
{
    const std::string szPid = "pid: ";
    for (size_t i = szText.find(szPid); i != std::string::npos; i = szText.find(szPid, i + 1)) {
        const size_t iNumber = i + szPid.size();
        const size_t iEnd = szText.find_first_not_of("0123456789", iNumber);
        szText.replace(iNumber, iEnd - iNumber, iEnd == iNumber ? "none" : "#");
    }
    return szText;
}

// The lines of one source file, in order, with process numbers masked.
inline std::string LogOf(const RUN_RESULT &result, const std::string &szFile)
{
    RUN_RESULT chosen = {};
    std::copy_if(result.log.begin(), result.log.end(), std::back_inserter(chosen.log),
                 [&szFile](const LOG_LINE &line) { return line.szText.starts_with(szFile); });
    return ProcessNumbersMask(LogText(chosen));
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

// ---- a run whose children work on the disks side by side ---------------------------------------

struct DISKS_CASE {
    const char *szName = "run";
    // What is done to each disk, with @ in place of its name. One that the machine does not have
    // is a blank one.
    std::map<std::string, STEPS> disks = {};
    STEPS beside = {}; // all the rest: sleeps, arrays, the duplication tool, faults
    STEPS errors = {}; // the lines of error priority, with process numbers masked
    MACHINE machine = MachineWithConf(CONF_RAID);
    std::vector<std::string> arguments = {}; // none: the preparing command
    std::string szOut = {};
    int status = 0;
    std::string szShell = {}; // the texts given to the shell; none: not compared
};

inline void PrintTo(const DISKS_CASE &row, std::ostream *pStream)
{
    *pStream << row.szName;
}

// The same steps on each of these disks.
inline std::map<std::string, STEPS> OnEach(const std::vector<std::string> &disks,
                                           const STEPS &steps)
{
    std::map<std::string, STEPS> all;
    for (const std::string &szDisk : disks) {
        all[szDisk] = steps;
    }
    return all;
}

inline RUN_RESULT ExpectDisks(const DISKS_CASE &row)
{
    SCOPED_TRACE(row.szName);
    const std::vector<std::string> arguments =
        row.arguments.empty() ? std::vector<std::string>{"initsys"} : row.arguments;
    MACHINE machine = row.machine;
    std::vector<std::string> names;
    for (const auto &[szDisk, steps] : row.disks) {
        if (!machine.files.contains("/sys/block/" + szDisk + "/size")) {
            MachineDiskAdd(machine, szDisk);
        }
        StepsExpect(machine, StepsOn(szDisk, steps));
        names.push_back(szDisk);
    }
    StepsExpect(machine, row.beside);
    if (!row.szShell.empty()) {
        ShellWatch(machine);
    }
    RUN_RESULT result = RunEnds(machine, arguments, row.status, row.szOut);
    for (const auto &[szDisk, steps] : row.disks) {
        EXPECT_EQ(CommandsOn(result, szDisk), StepsText(StepsOn(szDisk, steps)));
    }
    EXPECT_EQ(CommandsBeside(result, names), StepsText(row.beside));
    EXPECT_EQ(ProcessNumbersMask(LogErrors(result)), StepsText(row.errors));
    if (!row.szShell.empty()) {
        EXPECT_EQ(ShellText(), row.szShell);
    }
    return result;
}

// ---- without memory ----------------------------------------------------------------------------

inline constexpr char NO_MEMORY_FOR_LIST[] =
    "<11>arrayctl.cpp:# Out of memeory, failed to allocate memory for PNLIBSZLIST via "
    "NLIBCSzListAlloc\n";

// How many runs the tool ends with this line when one of its first 24 calls for memory fails,
// whichever calls they are. The C library's own are among them, and its glob() does not survive
// each of them, so only the runs that end in the line are looked at.
inline int RunsWithoutMemory(MACHINE machine, const std::string &szWord, const std::string &szLine)
{
    int nSeen = 0;
    for (const char *const szFunction : {"malloc", "calloc"}) {
        for (int nCall = 1; nCall <= 24; nCall++) {
            machine.faults = {{.szFunction = szFunction, .nCall = nCall}};
            const RUN_RESULT result = MachineTry(machine, {szWord});
            if (LogOf(result, "arrayctl.cpp") == szLine) {
                nSeen++;
                EXPECT_EQ(result.szOut, "");
                EXPECT_EQ(result.status, 1);
                EXPECT_EQ(result.problems, std::vector<std::string>());
            }
        }
    }
    return nSeen;
}
