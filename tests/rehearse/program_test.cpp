// SPDX-License-Identifier: MIT
//
// The program itself, on machines whose tools are stand-ins.
#include "rehearsal.h"

#include <gtest/gtest.h>

namespace
{

constexpr char EXAMINED[] = "/sbin/mdadm -E /dev/sda1";

// A tool that asks one question and runs one command.
MACHINE MachineWithTool(const std::string &szScript)
{
    MACHINE machine = MachineMake();
    RehearsalToolAdd(machine, szScript);
    MachineTool(machine, EXAMINED, {.szOut = "a report\n", .status = 3, .nTimes = ANY_TIMES});
    return machine;
}

RUN_RESULT Rehearsed(const std::string &szScript, const std::vector<std::string> &options)
{
    std::vector<std::string> words = options;
    words.insert(words.end(), {"--tool", REHEARSAL_OWN_TOOL, "any", "word"});
    return RehearsalTry(MachineWithTool(szScript), words);
}

TEST(Rehearsal, PassesQuestionsOnAndWritesCommandsDown)
{
    const RUN_RESULT result = Rehearsed("/sbin/mdadm -E /dev/sda1; echo \"asked: $?\"\n"
                                        "/sbin/mdadm -S /dev/md2; echo \"stopped: $?\"\n"
                                        "/sbin/mdadm 'a b' ''\n"
                                        "/sbin/lvremove -f x; echo complaint >&2; exit 7\n",
                                        {});
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.szErr, "");
    EXPECT_EQ(result.szOut, "Rehearsal of own any word: nothing has been changed.\n"
                            "\n"
                            "The disks, and what becomes of them:\n"
                            "\n"
                            "What is lost:\n"
                            "  nothing\n"
                            "\n"
                            "What should make you stop:\n"
                            "  nothing\n"
                            "\n"
                            "The commands:\n"
                            "  /sbin/mdadm -S /dev/md2\n"
                            "  /sbin/mdadm 'a b' ''\n"
                            "  /sbin/lvremove -f x\n"
                            "\n"
                            "What it prints:\n"
                            "  a report\n"
                            "  asked: 3\n"
                            "  stopped: 0\n"
                            "\n"
                            "What it prints to standard error:\n"
                            "  complaint\n"
                            "\n"
                            "What it logs:\n"
                            "  nothing\n"
                            "\n"
                            "Its exit status: 7\n");
}

TEST(Rehearsal, PrintsCommandsAlone)
{
    const RUN_RESULT result =
        Rehearsed("/sbin/mdadm -E /dev/sda1; /bin/umount -R 'a\nb'\n", {"--commands"});
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.szOut, "/bin/umount -R $'a\\012b'\n");
}

TEST(Rehearsal, PrintsJson)
{
    const RUN_RESULT result = Rehearsed("echo said; /sbin/mdadm -S /dev/md2; exit 1\n", {"--json"});
    EXPECT_EQ(result.status, 0);
    const size_t iProcess = result.szOut.find("\"process\": ");
    ASSERT_NE(iProcess, std::string::npos);
    EXPECT_EQ(result.szOut.substr(0, iProcess),
              "{\"command\": [\"any\", \"word\"],\n"
              " \"disks\": [],\n"
              " \"losses\": [],\n"
              " \"warnings\": [],\n"
              " \"commands\": [{\"argv\": [\"/sbin/mdadm\", \"-S\", \"/dev/md2\"], ");
    EXPECT_NE(result.szOut.find(" \"questions\": [],\n"
                                " \"output\": \"said\\u000a\",\n"
                                " \"errors\": \"\",\n"
                                " \"log\": [],\n"
                                " \"status\": 1}\n"),
              std::string::npos);
}

TEST(Rehearsal, ReadsTheToolsOwnLog)
{
    MACHINE machine = MachineMake();
    MachineFile(machine, "/etc.defaults/nuroinfo.conf", "");
    const RUN_RESULT result = RehearsalTry(machine, {"status", "2"});
    EXPECT_EQ(result.status, 0);
    EXPECT_NE(result.szOut.find("What it prints:\n  RAID /dev/md2 is not found\n"),
              std::string::npos);
    EXPECT_NE(result.szOut.find("Its exit status: 1\n"), std::string::npos);
    EXPECT_EQ(LogText(result), ""); // nothing reached the machine's own
}

TEST(Rehearsal, KeepsMarkersAndLeavesNone)
{
    MACHINE machine = MachineWithTool("echo /tmp/*; test -x /tmp/raid.1 && echo same\n"
                                      "echo new > /tmp/.dualhead; echo log > /var/log/any\n");
    MachineFile(machine, "/tmp/raid.1", "", 0755);
    MachineFile(machine, "/tmp/other", "");
    const RUN_RESULT result = RehearsalTry(machine, {"--tool", REHEARSAL_OWN_TOOL, "any"});
    EXPECT_EQ(result.status, 3); // a marker is set
    EXPECT_NE(result.szOut.find("What it prints:\n  /tmp/raid.1\n  same\n"), std::string::npos);
    EXPECT_FALSE(MachineFileRead("/tmp/.dualhead").has_value());
    EXPECT_FALSE(MachineFileRead("/var/log/any").has_value());
    EXPECT_TRUE(MachineFileRead("/tmp/other").has_value());
}

TEST(Rehearsal, LetsNothingBeWritten)
{
    const RUN_RESULT result = Rehearsed(
        "for file in /new /usr.rehearse/own /etc/new /sbin/mdadm /tmp/.arrayctl-rehearse/x\n"
        "do (echo x >\"$file\") 2>/dev/null && echo \"$file\"; done; echo tried\n",
        {});
    EXPECT_EQ(result.status, 0);
    EXPECT_NE(result.szOut.find("What it prints:\n  tried\n"), std::string::npos);
}

TEST(Rehearsal, EndsWhatTheToolLeaves)
{
    const RUN_RESULT result = Rehearsed("sleep 1000 & echo gone\n", {});
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.nUnreaped, 0);
    EXPECT_EQ(result.nRunning, 0);
}

// A status that a shell gives when it finds no program is the tool's own here.
TEST(Rehearsal, TellsAnyStatus)
{
    const RUN_RESULT result = Rehearsed("exit 127\n", {});
    EXPECT_EQ(result.status, 0);
    EXPECT_NE(result.szOut.find("Its exit status: 127\n"), std::string::npos);
}

TEST(Rehearsal, TellsOfAToolThatDoesNotStart)
{
    MACHINE machine = MachineMake();
    MachineFile(machine, REHEARSAL_OWN_TOOL, "#!/no/shell\n", 0755);
    const RUN_RESULT result = RehearsalTry(machine, {"--tool", REHEARSAL_OWN_TOOL, "any"});
    EXPECT_EQ(result.status, 2);
    EXPECT_EQ(result.szOut, "");
    EXPECT_EQ(result.szErr, "arrayctl-rehearse: the tool could not be started: No such file or "
                            "directory\n");
}

TEST(Rehearsal, TellsOfASignal)
{
    const RUN_RESULT result = Rehearsed("kill -KILL $$\n", {});
    EXPECT_EQ(result.status, 3);
    EXPECT_NE(result.szOut.find("the tool was ended by signal 9\n"), std::string::npos);
}

TEST(Rehearsal, BearsFloods)
{
    const RUN_RESULT result = Rehearsed(
        "i=0; while [ $i -lt 3000 ]; do i=$((i+1)); echo 0123456789012345678901234567890; "
        "done; /sbin/mdadm -S /dev/md2\n",
        {"--commands"});
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.szOut, "/sbin/mdadm -S /dev/md2\n");
}

struct REFUSAL_ROW {
    const char *szName;
    std::vector<std::string> words;
    const char *szError;
};

const REFUSAL_ROW REFUSAL_ROWS[] = {
    {"no command", {}, "no command is given; see --help\n"},
    {"no such option", {"--any"}, "no such option, or one without its value: --any\n"},
    {"no value", {"--tool"}, "no such option, or one without its value: --tool\n"},
    {"two forms", {"--json", "--commands", "x"}, "--commands and --json exclude each other\n"},
    {"no such tool", {"--tool", "/no/tool", "x"}, "/no/tool is no program\n"},
    {"a folder", {"--tool", "/tmp", "x"}, "/tmp is no program\n"},
    {"none in PATH",
     {"--tool", "arrayctl", "x"},
     "no program arrayctl in PATH; --tool names one\n"},
};

TEST(Rehearsal, RefusesWithASentence)
{
    for (const REFUSAL_ROW &row : REFUSAL_ROWS) {
        SCOPED_TRACE(row.szName);
        const RUN_RESULT result = RehearsalTry(MachineMake(), row.words);
        EXPECT_EQ(result.status, 2);
        EXPECT_EQ(result.szOut, "");
        EXPECT_EQ(result.szErr, std::string("arrayctl-rehearse: ") + row.szError);
    }
}

// What the host's own folders hold of these rules is masked by those of the machine.
TEST(Rehearsal, WarnsOfUdevsRules)
{
    constexpr char COMMAND[] = "/sbin/mdadm -S /dev/md2\n";
    constexpr char WARNED[] =
        "What should make you stop:\n"
        "  udev runs and /run/udev/rules.d/69-lvm.rules is not masked: it acts on arrays or groups "
        "while the command works on them\n\n";
    const auto statusOf = [&](const char *szScript, bool fUdev, bool fMasked) {
        MACHINE machine = MachineWithTool(szScript);
        MachineFile(machine, "/run/udev/rules.d/64-md-raid-assembly.rules", "a rule\n");
        MachineFile(machine, "/run/udev/rules.d/69-lvm.rules", "a rule\n");
        MachineFile(machine, "/etc/udev/rules.d/64-md-raid-assembly.rules", "");
        if (fUdev) {
            MachineFile(machine, "/run/udev/control", "");
        }
        if (fMasked) {
            MachineLink(machine, "/etc/udev/rules.d/69-lvm.rules", "/dev/null");
        }
        const RUN_RESULT result = RehearsalTry(machine, {"--tool", REHEARSAL_OWN_TOOL, "any"});
        EXPECT_EQ(result.szOut.find(WARNED) != std::string::npos, result.status == 3);
        return result.status;
    };
    EXPECT_EQ(statusOf(COMMAND, true, false), 3);
    EXPECT_EQ(statusOf(COMMAND, true, true), 0);
    EXPECT_EQ(statusOf(COMMAND, false, false), 0);
    EXPECT_EQ(statusOf("echo only asks\n", true, false), 0);
}

TEST(Rehearsal, NeedsATmp)
{
    MACHINE machine = MachineWithTool("exit 0\n");
    MachineRemove(machine, "/tmp");
    const RUN_RESULT result = RehearsalTry(machine, {"--tool", REHEARSAL_OWN_TOOL, "any"});
    EXPECT_EQ(result.status, 2);
    EXPECT_EQ(result.szErr, "arrayctl-rehearse: cannot open /tmp: No such file or directory\n");
}

} // namespace
