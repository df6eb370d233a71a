// SPDX-License-Identifier: MIT
//
// Surroundings that no installer should hand to the program, and what comes of each: it ends, by
// exit, with the words and the status of what it could find out, and runs nothing it was not to
// run.
#include "removal_machine.h"
#include "storage_machine.h"

#include "nurostoragecore/raid_remove.h"

#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sched.h>
#include <string>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

using namespace std::string_literals; // texts with a NUL in them

namespace
{

constexpr char REPORT[] = "/dev/md2 is running, status: NORMAL, rebuilding: None\n"
                          "Device level: RAID 1\n"
                          "Device size: 1024 MB (1073741824 bytes) \n"
                          "Disk: \n"
                          "\t [/dev/sdb3: Normal]\n"
                          "\t [/dev/sda3: Normal]\n"
                          "\n";

// ---- the two machines that most cases are about ------------------------------------------------

// A mirror that "destroy 2" takes down, command by command.
MACHINE MirrorToDestroy(const TOOL_ANSWER &answer = {})
{
    MACHINE machine = MachineWithMirror();
    StepsExpect(machine,
                Pvs("") + STEPS{{STOP_MD2, answer}, Examined("sdb3", UUID_MD2)} + MirrorWiped());
    return machine;
}

void DestroyTells(const MACHINE &machine)
{
    RunEnds(machine, {"destroy", "2"}, 0, "");
}

std::string CreateCommand(int nMd)
{
    const std::string szPartition = std::to_string(nMd + 1);
    return "/sbin/mdadm -C /dev/md" + std::to_string(nMd) + " -e 0.9 -amd -R -l1 -n4 /dev/sda" +
           szPartition + " /dev/sdb" + szPartition + " missing missing";
}

// Two blank disks that "initsys" makes the system.
MACHINE DisksToInit()
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    for (const char *const szDisk : {"sda", "sdb"}) {
        BlankDiskAdd(machine, szDisk);
        RenewExpect(machine, szDisk, RANGE_ALL);
    }
    MachineTool(machine, CreateCommand(0));
    MachineTool(machine, CreateCommand(1));
    return machine;
}

RUN_RESULT InitsysTells(const MACHINE &machine)
{
    return RunEnds(machine, {"initsys"}, 0, "");
}

// Whatever of its commands a run gets to, in any number; none but these may run.
void EveryRowMayRun(MACHINE &machine)
{
    for (TOOL_ROW &row : machine.rows) {
        row.answer.nTimes = ANY_TIMES;
    }
}

// A sanitizer needs some for itself.
#ifdef __SANITIZE_ADDRESS__
constexpr rlim_t DESCRIPTORS_NEEDED = 64;
#else
constexpr rlim_t DESCRIPTORS_NEEDED = 0;
#endif

void LimitSet(__rlimit_resource resource, rlim_t value)
{
    const struct rlimit limit = {value, value};
    (void)setrlimit(resource, &limit);
}

} // namespace

// ---- surroundings that change nothing ----------------------------------------------------------

namespace
{

// Programs with the tools' names stand where PATH leads.
void EnvironmentSpoil(MACHINE &machine)
{
    machine.environment = {{"PATH", "/evil::."},      {"IFS", "/dev"},
                           {"ENV", "/evil/profile"},  {"BASH_ENV", "/evil/profile"},
                           {"SHELL", "/evil/sh"},     {"LANG", "de_DE.UTF-8"},
                           {"LC_ALL", "tr_TR.UTF-8"}, {"LD_LIBRARY_PATH", "/evil"},
                           {"LD_BIND_NOW", "1"},      {"MALLOC_PERTURB_", "85"},
                           {"POSIXLY_CORRECT", "1"},  {"TZ", "%s/../../evil"}};
    for (const char *const szTool : {"mdadm", "sfdisk", "pvs", "sh"}) {
        MachineFile(machine, std::string("/evil/") + szTool, "#!/bin/sh\n: >/evil/ran\n", 0755);
    }
    MachineFile(machine, "/evil/profile", ": >/evil/ran\n");
}

// The pipes of the tools then have the numbers of the standard streams.
void StreamsClose()
{
    (void)close_range(STDIN_FILENO, STDERR_FILENO, 0);
}

void PipeSignalIgnore()
{
    (void)signal(SIGPIPE, SIG_IGN);
}

void SignalsBlock()
{
    sigset_t all;
    (void)sigfillset(&all);
    (void)sigprocmask(SIG_SETMASK, &all, nullptr);
}

struct SURROUNDINGS {
    const char *szName;
    void (*prepare)() = nullptr;
    void (*change)(MACHINE &machine) = [](MACHINE &) {};
};

struct HostileSurroundings : testing::TestWithParam<SURROUNDINGS> {
    static MACHINE In(MACHINE machine)
    {
        machine.prepare = GetParam().prepare;
        GetParam().change(machine);
        return machine;
    }
};

constexpr SURROUNDINGS SURROUNDINGS_CASES[] = {
    {"NoStreams", StreamsClose},
    {"AnIgnoredPipeSignal", PipeSignalIgnore},
    {"BlockedSignals", SignalsBlock},
    {"AnEnvironmentOfOtherTools", nullptr, EnvironmentSpoil},
    {"NoEnvironment", nullptr, [](MACHINE &machine) { machine.environment = {}; }},
    {"NoLog", nullptr, [](MACHINE &machine) { machine.fNoLog = true; }},
};

} // namespace

TEST_P(HostileSurroundings, ChangeNothingOfARemoval)
{
    DestroyTells(In(MirrorToDestroy()));
    EXPECT_FALSE(MachineFileRead("/evil/ran").has_value());
}

TEST_P(HostileSurroundings, ChangeNothingOfAnInstallation)
{
    InitsysTells(In(DisksToInit()));
    EXPECT_FALSE(MachineFileRead("/evil/ran").has_value());
}

INSTANTIATE_TEST_SUITE_P(All, HostileSurroundings, testing::ValuesIn(SURROUNDINGS_CASES),
                         ROW_NAME{});

// ---- standard streams --------------------------------------------------------------------------

TEST(HostileStreams, AReportWithoutStandardOutputIsStillARun)
{
    MACHINE machine = MachineWithMirror();
    machine.prepare = [] { (void)close(STDOUT_FILENO); };
    RunEnds(machine, {"status", "2"}, 0, "");
}

TEST(HostileStreams, AReportNeedsNoStandardInputOrError)
{
    MACHINE machine = MachineWithMirror();
    machine.prepare = [] {
        (void)close(STDIN_FILENO);
        (void)close(STDERR_FILENO);
    };
    RunEnds(machine, {"status", "2"}, 0, REPORT);
}

TEST(HostileStreams, AMissingArrayWithoutStandardOutputIsNotFound)
{
    MACHINE machine = MachineMake();
    machine.prepare = [] { (void)close(STDOUT_FILENO); };
    // The log's socket has not become the standard output.
    ExpectRuns({{.szName = "md7",
                 .machine = machine,
                 .arguments = {"status", "7"},
                 .status = 1,
                 .steps = {{"<15>raid_info.cpp:# Failed to open /dev/md7, errno=No such file or "
                            "directory"}}}});
}

TEST(HostileStreams, AToolOfTheShellHasAllThree)
{
    MACHINE machine = DisksToInit();
    machine.prepare = StreamsClose;
    int nCreated = 0;
    for (const RUN_EVENT &event : InitsysTells(machine).events) {
        if (event.kind == EVENT_KIND::COMMAND && event.argv[1] == "-C") {
            nCreated++;
            EXPECT_TRUE(event.fNullInput && event.fNullOutput && event.fNullError);
        }
    }
    EXPECT_EQ(nCreated, 2);
}

TEST(HostileStreams, AReaderThatIsGoneDoesNotChangeTheStatus)
{
    MACHINE machine = MachineWithMirror();
    machine.prepare = [] {
        int fds[2] = {-1, -1};
        (void)!pipe(fds);
        (void)dup2(fds[1], STDOUT_FILENO);
        (void)close(fds[0]);
        (void)close(fds[1]);
        PipeSignalIgnore();
    };
    RunEnds(machine, {"status", "2"}, 0);
}

// ---- limits ------------------------------------------------------------------------------------

namespace
{

// Under a limit that lets the run get anywhere, or nowhere: the loader ends with 127.
void LimitedRunEnds(const MACHINE &whole, const std::vector<std::string> &arguments,
                    __rlimit_resource resource, rlim_t value)
{
    constexpr int NOT_LOADED = 127;
    MACHINE machine = whole;
    EveryRowMayRun(machine);
    machine.fMayLeaveChildren = true; // children of a command that gave up are not waited for
    machine.prepare = [resource, value] { LimitSet(resource, value); };
    const RUN_RESULT result = MachineRun(machine, arguments);
    EXPECT_EQ(result.signal, 0) << "limit " << value;
    EXPECT_TRUE(result.status == 0 || result.status == 1 || result.status == NOT_LOADED)
        << result.status << " under limit " << value;
}

} // namespace

TEST(HostileLimits, FewDescriptorsEndDestroyInOrder)
{
    for (rlim_t nDescriptors = DESCRIPTORS_NEEDED; nDescriptors <= 64; nDescriptors += 2) {
        LimitedRunEnds(MirrorToDestroy(), {"destroy", "2"}, RLIMIT_NOFILE, nDescriptors);
    }
}

TEST(HostileLimits, FewDescriptorsEndInitsysInOrder)
{
    for (rlim_t nDescriptors = DESCRIPTORS_NEEDED; nDescriptors <= 64; nDescriptors += 4) {
        LimitedRunEnds(DisksToInit(), {"initsys"}, RLIMIT_NOFILE, nDescriptors);
    }
}

TEST(HostileLimits, WithOneDescriptorTooFewAnArrayIsNotFound)
{
    RunEnds(WithFault(MachineWithMirror(), {.szFunction = "open", .error = EMFILE, .fGoOn = true}),
            {"status", "2"}, 1, "RAID /dev/md2 is not found\n");
}

// A sanitizer needs terabytes of addresses.
#ifndef __SANITIZE_ADDRESS__
TEST(HostileLimits, LittleMemoryEndsDestroyInOrder)
{
    constexpr rlim_t MIB = 1024UL * 1024UL;
    std::vector<rlim_t> limits = {RLIM_INFINITY};
    for (rlim_t cb = MIB; cb <= 64 * MIB; cb += cb / 16) {
        limits.push_back(cb);
    }
    for (const rlim_t cb : limits) {
        LimitedRunEnds(MirrorToDestroy(), {"destroy", "2"}, RLIMIT_AS, cb);
    }
}
#endif

TEST(HostileLimits, ASmallStackIsEnough)
{
    constexpr rlim_t STACK_SIZE = 256UL * 1024UL;
    MACHINE machine = MirrorToDestroy();
    machine.prepare = [] { LimitSet(RLIMIT_STACK, STACK_SIZE); };
    DestroyTells(machine);
}

// What the limit of processes comes to for a user whom the kernel holds to it.
TEST(HostileLimits, WithoutProcessesDestroyCannotStopTheArray)
{
    MACHINE machine = MachineWithMirror();
    machine.faults = {{.szFunction = "fork", .error = EAGAIN, .fGoOn = true}};
    const RUN_RESULT result = RunEnds(machine, {"destroy", "2"}, 0, "");
    EXPECT_NE(LogText(result).find("Reach RAID stop retry limit\n"), std::string::npos);
}

TEST(HostileLimits, WithoutProcessesInitsysChangesNothing)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineDiskAdd(machine, "sda");
    machine.faults = {{.szFunction = "fork", .error = EAGAIN, .fGoOn = true}};
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 1);
    EXPECT_NE(LogText(result).find("<11>arrayctl.cpp:# Failed to fork.\n"), std::string::npos);
}

// ---- signals -----------------------------------------------------------------------------------

TEST(HostileSignals, ToolsThatCannotBeWaitedForCountAsWell)
{
    MACHINE machine = MirrorToDestroy();
    machine.prepare = [] { (void)signal(SIGCHLD, SIG_IGN); };
    DestroyTells(machine);
}

TEST(HostileSignals, DisksWhoseChildrenCannotBeWaitedForAreLeftAlone)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    BlankDiskAdd(machine, "sda");
    BlankDiskAdd(machine, "sdb");
    machine.prepare = [] { (void)signal(SIGCHLD, SIG_IGN); };
    const RUN_RESULT result = RunEnds(machine, {"initsys"}, 1);
    EXPECT_EQ(LogOf(result, "arrayctl.cpp"),
              "<11>arrayctl.cpp:# Wait pid failed. pid: # disk: sda\n"
              "<11>arrayctl.cpp:# Wait pid failed. pid: # disk: sdb\n"
              "<11>arrayctl.cpp:# No disk to create system and swap partition, initsys fail!\n");
}

// The shell's status is lost with it, so an array that was made counts as one that was not.
TEST(HostileSignals, AVolumeWhoseShellCannotBeWaitedForIsAFailure)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineDiskAdd(machine, "sda");
    for (const char *const szRest : {"--fast-delete 3:128 /dev/sda", "-M1 /dev/sda"}) {
        MachineTool(machine, std::string("/sbin/sfdisk ") + szRest);
    }
    MachineTool(machine, {"/sbin/sfdisk", "-N3", "", "-uS", "-q", "-f", "-j260352", "-z-1", "-tfd",
                          "-F", "/dev/sda"});
    MachineTool(machine, "/sbin/mdadm -C /dev/md2 -amd -R -l1 -f -n1 /dev/sda3");
    machine.prepare = [] { (void)signal(SIGCHLD, SIG_IGN); };
    const RUN_RESULT result = RunEnds(machine, {"newvol"}, 1, "Creating RAID 1 volume... \n");
    EXPECT_EQ(LogErrors(result),
              "<11>arrayctl.cpp:# Failed to create RAID '/dev/md2' on '/dev/sda3 ', errno=255\n");
}

TEST(HostileSignals, ChildrenThatReapThemselvesLeaveNoStatus)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, STOP_MD2, {.status = 1});
    (void)MachineCall(machine, [] {
        struct sigaction action = {};
        action.sa_handler = SIG_DFL;
        action.sa_flags = SA_NOCLDWAIT;
        ASSERT_EQ(sigaction(SIGCHLD, &action, nullptr), 0);
        EXPECT_EQ(RAIDStop("/dev/md2"), 0);
    });
}

// ---- umask -------------------------------------------------------------------------------------

TEST(HostileUmask, FilesAreMadeWhateverItHides)
{
    for (const mode_t mask : {0777U, 0U}) {
        MACHINE machine = MachineWithConf(CONF_RAID);
        machine.prepare = [mask] { (void)umask(mask); };
        RunEnds(machine, {"newvol"}, 1, "No disk to create RAID... \n");
        EXPECT_EQ(MachineFileRead("/tmp/.not.dualhead"), "");
    }
}

TEST(HostileUmask, TheErrorLogIsWrittenWhateverItHides)
{
    MACHINE machine = MirrorToDestroy({.szErr = "mdadm: stopped /dev/md2\n"});
    machine.prepare = [] { (void)umask(0777); };
    DestroyTells(machine);
    EXPECT_EQ(OperationErrors(), "Nov 05 01:02:03 command=\"/sbin/mdadm -S /dev/md2\" "
                                 "Error=\"mdadm: stopped /dev/md2 \"\n");
}

// ---- names in /sys and /proc -------------------------------------------------------------------

namespace
{

const std::vector<std::string> NAMES = {"sda 1",  "sda\n1", "sda%s%n%d", "sda'1",
                                        "sda\"1", "sda`x`", "sda$(x)",   "sd\xe4\xff",
                                        "sda\\",  "sda;x",  "sda*",      "sda\x01"};

} // namespace

TEST(HostileNames, MembersAreToldAsTheyAreUpTo120Characters)
{
    std::vector<std::pair<std::string, std::string>> names = {
        {"sd" + std::string(240, 'a'), "sd" + std::string(120, 'a')}};
    for (const std::string &szName : NAMES) {
        names.emplace_back(szName, szName);
    }
    for (const auto &[szName, szTold] : names) {
        MACHINE machine = MachineMake();
        MachineMdAdd(machine, {.nMd = 2, .members = {{szName}}});
        const RUN_RESULT result = RunEnds(machine, {"status", "2"}, 0);
        EXPECT_NE(result.szOut.find("\t [/dev/" + szTold + ": Normal]\n\n"), std::string::npos)
            << result.szOut;
    }
}

// Up to its first character that is no letter, a disk's name is the disk's.
TEST(HostileNames, DisksAreAskedForAsOneArgument)
{
    for (const std::string &szName : NAMES) {
        MACHINE machine = MachineWithConf(CONF_RAID);
        MachineDiskAdd(machine, szName);
        for (const char *const szNumber : {"-N1", "-N2"}) {
            MachineTool(machine, {"/sbin/sfdisk", "-l", "-uS", szNumber, "/dev/" + szName},
                        {.nTimes = szName.starts_with("sda") ? 1 : ANY_TIMES});
        }
        const RUN_RESULT result = MachineRun(machine, {"enumformatalldisks"});
        const bool fListed = szName.starts_with("sda");
        EXPECT_EQ(result.szOut, fListed ? "1 " : "") << szName;
        EXPECT_EQ(result.status, fListed ? 1 : 0) << szName;
    }
}

TEST(HostileNames, PartitionsAreExaminedAsOneArgument)
{
    MACHINE machine = MachineWithMirror();
    MachineFile(machine, "/proc/partitions",
                "major minor  #blocks  name\n\n   8 3 1 sda3\n   8 4 1 sd%s%n4\n   8 5 1 sd';x;'5\n"
                "   8 6 1 sd\xe4\xff"
                "6\n   8 7 1 sd a7\n");
    StepsExpect(machine,
                Pvs("") +
                    STEPS{{STOP_MD2}, Examined("sdb3", UUID_MD2), Examined("sda3", UUID_MD2)} +
                    Wiped("sda3"));
    for (const char *const szPath : {"/dev/sd%s%n4", "/dev/sd';x;'5",
                                     "/dev/sd\xe4\xff"
                                     "6"}) {
        MachineTool(machine, {"/sbin/mdadm", "-E", szPath}, {.status = 1});
    }
    DestroyTells(machine);
}

// The two commands that go through the shell take the names as they are. The kernel makes no such
// name; this is what would become of one.
TEST(HostileNames, TheShellReadsWhatIsInADisksName)
{
    const std::string szDisk = "sda>made";
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineDiskAdd(machine, szDisk);
    for (const char *const szNumber : {"-N1", "-N2"}) {
        MachineTool(machine, {"/sbin/sfdisk", "-l", "-uS", szNumber, "/dev/" + szDisk});
    }
    RenewExpect(machine, szDisk, RANGE_ALL);
    for (const char *const szMd : {"/dev/md0", "/dev/md1"}) {
        MachineTool(machine, std::string("/sbin/mdadm -C ") + szMd +
                                 " -e 0.9 -amd -R -l1 -f -n4 /dev/sda missing missing missing");
    }
    RunEnds(machine, {"initsys"}, 0);
    EXPECT_EQ(MachineFileRead("/made1"), "");
    EXPECT_EQ(MachineFileRead("/made2"), "");
}

// ---- attributes --------------------------------------------------------------------------------

TEST(HostileAttributes, LongOnesAreReadUpToTheirLimit)
{
    const std::string szLong(4095, '1');
    MACHINE machine = MachineMake();
    MachineMdAdd(machine, {.nMd = 2,
                           .size = 0,
                           .members = {{"sda3", "spare" + szLong, "none" + szLong}},
                           .szSyncAction = szLong,
                           .szComponentSize = szLong});
    const RUN_RESULT result = RunEnds(machine, {"status", "2"}, 0);
    EXPECT_NE(result.szOut.find("\t [/dev/sda3: Spare Disk]\n"), std::string::npos);
}

TEST(HostileAttributes, EmptyOnesLeaveTheMemberOut)
{
    MACHINE machine = MachineMake();
    MachineMdAdd(machine, {.nMd = 2, .members = {{"sda3", ""}, {"sdb3", "in_sync\n", ""}}});
    const RUN_RESULT result = RunEnds(machine, {"status", "2"}, 0);
    EXPECT_NE(result.szOut.find("Disk: \n\n"), std::string::npos);
}

TEST(HostileAttributes, BinaryOnesAreNoNumbers)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    PartitionedDiskAdd(machine, "sda", PLACES_8);
    MachineFile(machine, "/sys/block/sda/sda1/start", "\0\xff\xfe\n"s);
    MachineTool(machine, ListingCommand("sda", 1), {.szOut = Listing("sda", 1, 2048, 4980480)});
    MachineTool(machine, ListingCommand("sda", 2));
    const RUN_RESULT result = MachineRun(machine, {"enumformatalldisks"});
    EXPECT_EQ(result.szOut, "1 ");
    EXPECT_EQ(LogOf(result, "partition_layout.cpp"),
              "<15>partition_layout.cpp:# /dev/sda: dont contain partition [1]\n"
              "<15>partition_layout.cpp:# /dev/sda: dont contain partition [1]\n");
}

// ---- the configuration file --------------------------------------------------------------------

namespace
{

constexpr char CONF_PATH[] = "/etc.defaults/nuroinfo.conf";
constexpr char NO_MASKS[] = "<11>disk_port.cpp:# Get usbportcfg key from "
                            "/etc.defaults/nuroinfo.conf Error\n";

// The one disk of the machine is there, and no key says what port it hangs on.
void NothingIsKnown(MACHINE machine)
{
    MachineDiskAdd(machine, "sda");
    const RUN_RESULT result = RunEnds(machine, {"enumformatalldisks"}, 0, "");
    EXPECT_NE(LogText(result).find(NO_MASKS), std::string::npos);
}

} // namespace

TEST(HostileConf, AFolderHoldsNoKey)
{
    MACHINE machine = MachineMake();
    MachineFolder(machine, CONF_PATH);
    NothingIsKnown(machine);
}

// Reading waits for a writer, as it does everywhere; with one that comes and goes it holds no key.
TEST(HostileConf, APipeIsWaitedForUntilItsWriterCloses)
{
    MACHINE machine = MachineMake();
    machine.fifos = {CONF_PATH};
    machine.msSilence = 1000;
    EXPECT_TRUE(MachineTry(machine, {"newvol"}).fTimedOut);

    machine.msSilence = 0;
    machine.fMayLeaveChildren = true;
    machine.prepare = [] {
        if (fork() != 0) {
            return;
        }
        for (int fd = open(CONF_PATH, O_WRONLY); fd >= 0; fd = open(CONF_PATH, O_WRONLY)) {
            (void)close(fd);
            (void)usleep(10000); // the reader is at its next key by then, or at its end
        }
        _exit(0);
    };
    NothingIsKnown(machine);
}

TEST(HostileConf, ALineOfTenMegabytesIsReadWhole)
{
    const std::string szLong(10UL * 1024UL * 1024UL, 'x');
    NothingIsKnown(MachineWithConf("usbportcfg=" + szLong));
    MACHINE machine = MachineWithConf(szLong + "\n" + CONF_RAID);
    BlankDiskAdd(machine, "sda");
    RunEnds(machine, {"enumformatalldisks"}, 1, "1 ");
}

// Line ends of two characters are trimmed, and a line ends at its NUL.
TEST(HostileConf, ItsLinesMayEndOddly)
{
    for (const std::string &szText :
         {"maxdisks=4\r\nusbportcfg=0x30\r\ninternalportcfg=\"0xf\"\r\n"s,
          "\0\0\nusbportcfg=0x30\0=\ninternalportcfg=0xf\0x\n"s}) {
        MACHINE machine = MachineWithConf(szText);
        BlankDiskAdd(machine, "sda");
        RunEnds(machine, {"enumformatalldisks"}, 1, "1 ");
    }
}

TEST(HostileConf, AnEmptyOneAndOneOfBytesHoldNoKey)
{
    std::string szBytes;
    for (int i = 0; i < 65536; i++) {
        szBytes += static_cast<char>((i * 7919) >> 5);
    }
    NothingIsKnown(MachineWithConf(""));
    NothingIsKnown(MachineWithConf(szBytes));
}

// ---- file systems that are full or missing -----------------------------------------------------

namespace
{

// A file system without room for one file more, for this run only.
void FullMount(const char *szFolder)
{
    if (unshare(CLONE_NEWNS) != 0 ||
        mount("full", szFolder, "tmpfs", 0, "size=4096,nr_inodes=1") != 0) {
        perror(szFolder);
        _exit(126);
    }
}

} // namespace

TEST(HostileDisks, AFullLogChangesNothingOfARemoval)
{
    MACHINE machine = MirrorToDestroy({.szErr = "mdadm: stopped /dev/md2\n"});
    machine.prepare = [] { FullMount("/var/log"); };
    const RUN_RESULT result = RunEnds(machine, {"destroy", "2"}, 0);
    EXPECT_NE(
        LogText(result).find("<11>space.cpp:# Fail to open /var/log/space_operation_error.log\n"),
        std::string::npos);
}

TEST(HostileDisks, AFullTmpDoesNotChangeTheAnswer)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    BlankDiskAdd(machine, "sda");
    machine.prepare = [] { FullMount("/tmp"); };
    const RUN_RESULT result = MachineRun(machine, {"enumformatalldisks"});
    EXPECT_EQ(result.szOut, "1 ");
    EXPECT_EQ(LogErrors(result),
              "<11>file.cpp:# file exist: /tmp/.not.dualhead, errno=No space left on device\n"
              "<11>conf.cpp:# Failed to touch '/tmp/.not.dualhead'\n");
}

TEST(HostileDisks, WithoutSysAnArrayHasNoMembersAndAMachineNoDisks)
{
    MACHINE machine = MachineWithMirror();
    MachineConf(machine, CONF_RAID);
    MachineRemove(machine, "/sys");
    const RUN_RESULT status = RunEnds(machine, {"status", "2"}, 0);
    EXPECT_NE(status.szOut.find("Disk: \n\n"), std::string::npos);
    RunEnds(machine, {"enumformatalldisks"}, 0, "");
}

TEST(HostileDisks, WithoutProcAnArrayIsStoppedAndNothingWiped)
{
    ExpectRuns({{.szName = "no /proc",
                 .machine = Without(MachineWithMirror(), "/proc"),
                 .arguments = {"destroy", "2"},
                 .steps = Pvs("") + STEPS{Examined("sdb3", UUID_MD2),
                                          {STOP_MD2},
                                          CLEAN_TOLD,
                                          {"<11>partition_enum.cpp:# Failed to read line of "
                                           "/proc/partitions, errno=0x900"},
                                          {"<11>raid_remove.cpp:# Fail to enum partition path"},
                                          {"<11>raid_remove.cpp:# Fail to get RAID UUID hash"}}}});
}

// ---- tools -------------------------------------------------------------------------------------

// A report is read to its end, and the end comes with the last holder of the stream.
TEST(HostileTools, AGrandchildThatHoldsTheStreamIsWaitedFor)
{
    constexpr int MS_HELD = 700;
    MACHINE machine = MirrorToDestroy({.msGrandchild = MS_HELD});
    machine.fMayLeaveChildren = true;
    const RUN_RESULT result = RunEnds(machine, {"destroy", "2"}, 0);
    EXPECT_GE(result.seconds, MS_HELD / 1000.0);
}

// The first line is all that is read of a listing, so nobody is waited for.
TEST(HostileTools, AListingThatGoesOnForeverIsNotReadToItsEnd)
{
    MACHINE machine = MachineWithConf(CONF_RAID);
    MachineDiskAdd(machine, "sda");
    for (const int nPartition : {1, 2}) {
        MachineTool(machine, ListingCommand("sda", nPartition),
                    {.cbFlood = 1UL << 20U, .msGrandchild = 300});
    }
    machine.fMayLeaveChildren = true;
    RunEnds(machine, {"enumformatalldisks"}, 1, "1 ");
}

TEST(HostileTools, AShellThatIsMissingOrAFolderMakesNoArray)
{
    for (const TOOL_KIND kind : {TOOL_KIND::MISSING, TOOL_KIND::FOLDER}) {
        MACHINE machine = DisksToInit();
        machine.rows.pop_back();
        machine.rows.pop_back();
        machine.tools["/bin/sh"] = kind;
        const RUN_RESULT result = RunEnds(machine, {"initsys"}, 0);
        EXPECT_NE(LogErrors(result).find("Failed to create RAID '/dev/md0' on"), std::string::npos);
        EXPECT_NE(LogErrors(result).find("Failed to create RAID '/dev/md1' on"), std::string::npos);
    }
}
