// SPDX-License-Identifier: MIT
#include "sandbox.h"

#include <gtest/gtest.h>

namespace
{

constexpr const char *USAGE = "usage:\n"
                              "\tarrayctl destroy <RAID ID> \n"
                              "\tarrayctl status <RAID ID> \n"
                              "\tarrayctl newvol \n"
                              "\tarrayctl initsys \n"
                              "\tarrayctl initsys-dd \n";

constexpr const char *PVS = "/sbin/pvs -o pv_name,vg_name,lv_name,origin --noheading --separator :";

// A machine that is told what it is, without a single disk.
MACHINE DisklessMake()
{
    MACHINE machine = MachineMake();
    MachineConf(machine, "maxdisks=4\nsupportraid=yes\nusbportcfg=0xf0\ninternalportcfg=0xf\n");
    return machine;
}

void ExpectRefused(const std::vector<std::string> &arguments, const std::string &szOut)
{
    SCOPED_TRACE(testing::PrintToString(arguments));
    const RUN_RESULT result = RunEnds(DisklessMake(), arguments, 1, szOut);
    EXPECT_EQ(OrderText(result), "");
}

} // namespace

TEST(CommandLine, NoCommandPrintsTheUsage)
{
    ExpectRefused({}, USAGE);
}

TEST(CommandLine, AnUnknownCommandIsNotRecognized)
{
    const std::string szRefused = std::string("command not recognized\n") + USAGE;
    for (const char *const szWord : {"",
                                     "Status",
                                     "STATUS",
                                     "statu",
                                     "status2",
                                     " status",
                                     "status ",
                                     "destroyed",
                                     "dest",
                                     "Destroy",
                                     "newvols",
                                     "new",
                                     "initsy",
                                     "initsys-",
                                     "initsys-ddd",
                                     "initsysdd",
                                     "enumformatalldisk",
                                     "enumformatalldisks_",
                                     "enumformatalldisks_indualhead",
                                     "enumformatalldisks_indualhead_install2",
                                     "help",
                                     "--help",
                                     "-h",
                                     "2",
                                     "\xff"}) {
        ExpectRefused({szWord}, szRefused);
        ExpectRefused({szWord, "2"}, szRefused);
    }
}

TEST(CommandLine, DestroyWithAWrongCountPrintsTheUsageAlone)
{
    ExpectRefused({"destroy"}, USAGE);
    ExpectRefused({"destroy", "2", "extra"}, USAGE);
    ExpectRefused({"destroy", "2", ""}, USAGE);
    ExpectRefused({"destroy", "2", "3", "4"}, USAGE);
}

TEST(CommandLine, StatusWithoutAnIdSaysSoFirst)
{
    ExpectRefused({"status"}, std::string("parameters not enough\n") + USAGE);
}

TEST(CommandLine, NewvolTakesNothing)
{
    ExpectRefused({"newvol", "3"}, USAGE);
    ExpectRefused({"newvol", "3", "4"}, USAGE);
    ExpectRefused({"newvol", ""}, USAGE);
}

struct RAID_ID_CASE {
    const char *szArgument;
    const char *szPath;
};

constexpr RAID_ID_CASE RAID_IDS[] = {
    {"7", "/dev/md7"},
    {"abc", "/dev/md0"},
    {"", "/dev/md0"},
    {"-1", "/dev/md-1"},
    {"2x", "/dev/md2"},
    {"x2", "/dev/md0"},
    {" 2", "/dev/md2"},
    {"\t\n 12", "/dev/md12"},
    {" \t+4", "/dev/md4"},
    {"+3", "/dev/md3"},
    {"- 3", "/dev/md0"},
    {"--3", "/dev/md0"},
    {"007", "/dev/md7"},
    {"0x10", "/dev/md0"},
    {"1.9", "/dev/md1"},
    {"/dev/md2", "/dev/md0"},
    {"2147483647", "/dev/md2147483647"},
    {"2147483648", "/dev/md2147483647"},
    {"4294967298", "/dev/md2147483647"},
    {"99999999999999999999999", "/dev/md2147483647"},
    {"-2147483648", "/dev/md-2147483648"},
    {"-2147483649", "/dev/md-2147483648"},
    {"-99999999999999999999999", "/dev/md-2147483648"},
};

TEST(CommandLine, StatusMakesThePathFromTheLeadingNumber)
{
    for (const RAID_ID_CASE &id : RAID_IDS) {
        SCOPED_TRACE(id.szArgument);
        const RUN_RESULT result = RunEnds(MachineMake(), {"status", id.szArgument}, 1,
                                          std::string("RAID ") + id.szPath + " is not found\n");
        EXPECT_EQ(LogText(result), std::string("<15>raid_info.cpp:# Failed to open ") + id.szPath +
                                       ", errno=No such file or directory\n");
    }
}

TEST(CommandLine, DestroyMakesThePathFromTheLeadingNumber)
{
    for (const RAID_ID_CASE &id : RAID_IDS) {
        SCOPED_TRACE(id.szArgument);
        MACHINE machine = MachineMake();
        MachineTool(machine, PVS);
        RunEnds(machine, {"destroy", id.szArgument}, 0,
                std::string("Not found ") + id.szPath + " \n");
    }
}

TEST(CommandLine, StatusIgnoresWhatFollowsTheId)
{
    MACHINE machine = MachineMake();
    MachineMdAdd(machine, {.nMd = 2});
    const RUN_RESULT plain = MachineRun(machine, {"status", "2"});
    EXPECT_TRUE(plain.szOut.starts_with("/dev/md2 is running, status: NORMAL"));
    EXPECT_EQ(plain.status, 0);
    for (const std::vector<std::string> &arguments :
         {std::vector<std::string>{"status", "2", "extra"},
          std::vector<std::string>{"status", "2", "5", "7", "status"}}) {
        RunEnds(machine, arguments, 0, plain.szOut);
    }
}

TEST(CommandLine, NewvolAloneIsTaken)
{
    const RUN_RESULT result =
        RunEnds(DisklessMake(), {"newvol"}, 1, "No disk to create RAID... \n");
    EXPECT_EQ(TranscriptText(result), "");
}

TEST(CommandLine, InitsysIgnoresWhatFollows)
{
    for (const std::vector<std::string> &arguments :
         {std::vector<std::string>{"initsys"}, std::vector<std::string>{"initsys", "anything"},
          std::vector<std::string>{"initsys", "2", "3"}}) {
        const RUN_RESULT result = RunEnds(DisklessMake(), arguments, 1, "");
        EXPECT_EQ(LogText(result), "<11>arrayctl.cpp:# No disk to create system and swap "
                                   "partition, initsys fail!\n");
        EXPECT_EQ(TranscriptText(result), "");
    }
}

TEST(CommandLine, InitsysDdIgnoresWhatFollowsAndDuplicates)
{
    for (const std::vector<std::string> &arguments :
         {std::vector<std::string>{"initsys-dd"},
          std::vector<std::string>{"initsys-dd", "anything"}}) {
        MACHINE machine = DisklessMake();
        MachineTool(machine, "/bin/nurodd");
        const RUN_RESULT result = RunEnds(machine, arguments, 1, "");
        EXPECT_EQ(TranscriptText(result), "/bin/nurodd\n");
    }
}

TEST(CommandLine, TheEnumerationsAreTakenThoughNotAdvertised)
{
    for (const std::vector<std::string> &arguments :
         {std::vector<std::string>{"enumformatalldisks"},
          std::vector<std::string>{"enumformatalldisks", "anything"},
          std::vector<std::string>{"enumformatalldisks_indualhead_install"},
          std::vector<std::string>{"enumformatalldisks_indualhead_install", "2", "3"}}) {
        const RUN_RESULT result = RunEnds(DisklessMake(), arguments, 0, "");
        EXPECT_EQ(OrderText(result), "");
    }
}

TEST(CommandLine, TheTwoEnumerationsDifferOnlyOnADualHeadMachine)
{
    MACHINE machine = DisklessMake();
    MachineDiskAdd(machine, "sda");
    MachineTool(machine, "/sbin/sfdisk ...", {.nTimes = ANY_TIMES});
    MachineTool(machine, "/sbin/mdadm ...", {.nTimes = ANY_TIMES});
    for (const char *const szWord :
         {"enumformatalldisks", "enumformatalldisks_indualhead_install"}) {
        RunEnds(machine, {szWord}, 1, "1 ");
    }
}

TEST(CommandLine, TheLogIsWrittenUnderTheProgramsOwnName)
{
    const RUN_RESULT result = MachineRun(MachineMake(), {"status", "7"});
    ASSERT_EQ(result.log.size(), 1U);
    EXPECT_EQ(result.log[0].szTag, "arrayctl");
    EXPECT_EQ(result.log[0].priority, 15);
}
