// SPDX-License-Identifier: MIT
#include "steps.h"

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

constexpr char CONF[] = "maxdisks=4\nsupportraid=yes\nusbportcfg=0xf0\ninternalportcfg=0xf\n";

// On a machine that is told what it is, without a single disk.
void ExpectWords(const std::vector<std::string> &arguments, int status, const std::string &szOut,
                 const STEPS &steps = {})
{
    ExpectRun({.szName = testing::PrintToString(arguments).c_str(),
               .machine = MachineWithConf(CONF),
               .arguments = arguments,
               .szOut = szOut,
               .status = status,
               .steps = steps});
}

void ExpectRefused(const std::vector<std::string> &arguments, const std::string &szOut)
{
    ExpectWords(arguments, 1, szOut);
}

TEST(CommandLine, NoCommandPrintsTheUsage)
{
    ExpectRefused({}, USAGE);
}

TEST(CommandLine, AnUnknownCommandIsNotRecognized)
{
    const std::string szRefused = std::string("command not recognized\n") + USAGE;
    const std::vector<const char *> words = {"",
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
                                             "\xff"};
    for (const char *const szWord : words) {
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
        ExpectRun({.szName = id.szPath,
                   .arguments = {"status", id.szArgument},
                   .szOut = std::string("RAID ") + id.szPath + " is not found\n",
                   .status = 1,
                   .steps = {{std::string("<15>raid_info.cpp:# Failed to open ") + id.szPath +
                              ", errno=No such file or directory"}}});
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

const STEPS NO_DISK = {
    {"<11>arrayctl.cpp:# No disk to create system and swap partition, initsys fail!"}};

TEST(CommandLine, NewvolAloneIsTaken)
{
    ExpectWords({"newvol"}, 1, "No disk to create RAID... \n");
}

TEST(CommandLine, InitsysIgnoresWhatFollows)
{
    ExpectWords({"initsys"}, 1, "", NO_DISK);
    ExpectWords({"initsys", "anything"}, 1, "", NO_DISK);
    ExpectWords({"initsys", "2", "3"}, 1, "", NO_DISK);
}

TEST(CommandLine, InitsysDdIgnoresWhatFollowsAndDuplicates)
{
    ExpectWords({"initsys-dd"}, 1, "", STEPS{{"/bin/nurodd"}} + NO_DISK);
    ExpectWords({"initsys-dd", "anything"}, 1, "", STEPS{{"/bin/nurodd"}} + NO_DISK);
}

TEST(CommandLine, TheEnumerationsAreTakenThoughNotAdvertised)
{
    ExpectWords({"enumformatalldisks"}, 0, "");
    ExpectWords({"enumformatalldisks", "anything"}, 0, "");
    ExpectWords({"enumformatalldisks_indualhead_install"}, 0, "");
    ExpectWords({"enumformatalldisks_indualhead_install", "2", "3"}, 0, "");
}

TEST(CommandLine, TheTwoEnumerationsDifferOnlyOnADualHeadMachine)
{
    MACHINE machine = MachineWithConf(CONF);
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

} // namespace
