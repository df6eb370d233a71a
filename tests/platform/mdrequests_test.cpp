// SPDX-License-Identifier: MIT
//
// Programs under mdrequests. Arrays are loop devices without a file, and text files where sysfs
// would have an array's: in a mount namespace of the test's own, so that the program looks where it
// always looks.
#include <array>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <linux/major.h>
#include <sched.h>
#include <string>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

namespace
{

using std::string;
using WORDS = std::vector<string>;

constexpr const char *LAUNCHER = TESTED_MDREQUESTS;
constexpr const char *CLIENT = CLIENT_SHARED;
constexpr const char *SYSFS_DEVICES = "/sys/dev/block";
constexpr const char *OLD_KERNEL =
    "mdrequests: this kernel cannot hold a program at a request; Linux 5.9 and later can, with "
    "CONFIG_SECCOMP_FILTER\n";

// One of the test's arrays by its number: its node, and its folder in sysfs.
string Node(int number)
{
    return "/mnt/array" + std::to_string(number);
}

string Folder(int number)
{
    return string(SYSFS_DEVICES) + "/" + std::to_string(LOOP_MAJOR) + ":" + std::to_string(number) +
           "/md";
}

void Write(const string &szPath, const string &text)
{
    std::filesystem::create_directories(std::filesystem::path(szPath).parent_path());
    std::ofstream stream(szPath);
    stream << text;
    stream.close();
    ASSERT_TRUE(stream.good()) << szPath;
}

struct STARTED {
    pid_t pid;
    int fdOut; // both streams of the program
};

struct RESULT {
    int status; // as waitpid has it
    string out;
};

// Standard output and error of the program come over one pipe, in their order.
STARTED Start(const WORDS &words)
{
    std::array<int, 2> ends = {};
    std::vector<char *> arguments;
    for (const string &szWord : words) {
        arguments.push_back(const_cast<char *>(szWord.c_str()));
    }
    arguments.push_back(nullptr);
    EXPECT_EQ(pipe2(ends.data(), O_CLOEXEC), 0);
    const pid_t pid = fork();
    if (pid == 0) {
        (void)close(STDIN_FILENO);
        (void)open("/dev/null", O_RDONLY);
        (void)dup2(ends[1], STDOUT_FILENO);
        (void)dup2(ends[1], STDERR_FILENO);
        (void)execvp(arguments[0], arguments.data());
        _exit(EXIT_FAILURE);
    }
    (void)close(ends[1]);
    return {pid, ends[0]};
}

// Reads until every writer is gone.
string ReadToEnd(int fd)
{
    string text;
    std::array<char, 512> piece = {};
    ssize_t cb = 0;
    while ((cb = read(fd, piece.data(), piece.size())) > 0) {
        text.append(piece.data(), static_cast<size_t>(cb));
    }
    (void)close(fd);
    return text;
}

// The process that answers becomes this one's child when the launcher's own child has ended.
void ExpectServersEnd(int nServers)
{
    for (int i = 0; i < nServers; i++) {
        int status = -1;
        EXPECT_GT(waitpid(-1, &status, 0), 0);
        EXPECT_EQ(status, 0);
    }
    EXPECT_EQ(waitpid(-1, nullptr, WNOHANG), -1) << "somebody is left";
}

RESULT End(const STARTED &started)
{
    RESULT result = {-1, ReadToEnd(started.fdOut)};
    EXPECT_EQ(waitpid(started.pid, &result.status, 0), started.pid);
    return result;
}

// Under the launcher; what served it has ended as well.
RESULT Launch(const WORDS &words, int nServers = 1)
{
    WORDS all = {LAUNCHER};
    all.insert(all.end(), words.begin(), words.end());
    RESULT result = End(Start(all));
    ExpectServersEnd(nServers);
    return result;
}

WORDS Client(const char *szClient, const WORDS &words)
{
    WORDS all = {szClient};
    all.insert(all.end(), words.begin(), words.end());
    return all;
}

void ExpectExit(const RESULT &result, int status, const string &out)
{
    EXPECT_TRUE(WIFEXITED(result.status)) << result.status;
    EXPECT_EQ(WEXITSTATUS(result.status), status);
    EXPECT_EQ(result.out, out);
}

struct MdRequests : testing::Test {
    // A namespace and a folder of devices for the whole program.
    static void SetUpTestSuite()
    {
        ASSERT_EQ(unshare(CLONE_NEWNS), 0) << "wants root";
        ASSERT_EQ(mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr), 0);
        ASSERT_EQ(mount("tmpfs", "/mnt", "tmpfs", 0, nullptr), 0);
        ASSERT_EQ(mount("tmpfs", SYSFS_DEVICES, "tmpfs", 0, nullptr), 0);
        ASSERT_EQ(prctl(PR_SET_CHILD_SUBREAPER, 1, 0, 0, 0), 0);
        for (int number = 0; number < 3; number++) {
            ASSERT_EQ(mknod(Node(number).c_str(), S_IFBLK | 0600,
                            makedev(LOOP_MAJOR, static_cast<unsigned>(number))),
                      0);
            const int fd = open(Node(number).c_str(), O_RDONLY | O_CLOEXEC);
            ASSERT_GE(fd, 0) << "the kernel has no loop devices: modprobe loop";
            (void)close(fd);
        }
    }

    // Number 0 is a mirror that rebuilds, number 1 one in good health, number 2 no array.
    void SetUp() override
    {
        ArrayMake(0, "active", "1", "recover", "65536 / 130944");
        Write(Folder(0) + "/rd1/state", "spare\n");
        ArrayMake(1, "clean", "0", "idle", "none");
    }

    void TearDown() override
    {
        for (const int number : {0, 1}) {
            std::filesystem::remove_all(Folder(number));
        }
    }

    static void ArrayMake(int number, const char *szState, const char *szDegraded,
                          const char *szAction, const char *szCompleted)
    {
        const string folder = Folder(number) + "/";
        Write(folder + "array_state", string(szState) + "\n");
        Write(folder + "level", "raid1\n");
        Write(folder + "raid_disks", "2\n");
        Write(folder + "layout", "0\n");
        Write(folder + "degraded", string(szDegraded) + "\n");
        Write(folder + "sync_action", string(szAction) + "\n");
        Write(folder + "sync_completed", string(szCompleted) + "\n");
        Write(folder + "resync_start", "none\n");
        Write(folder + "rd0/state", "in_sync\n");
        Write(folder + "rd1/state", "in_sync\n");
    }

    // The array's level becomes a pipe: its reader is held there until LevelWrite.
    static void LevelHold(int number)
    {
        std::filesystem::remove(Folder(number) + "/level");
        ASSERT_EQ(mkfifo((Folder(number) + "/level").c_str(), 0600), 0);
    }

    // Returns when somebody reads the level.
    static int LevelOpen(int number)
    {
        return open((Folder(number) + "/level").c_str(), O_WRONLY | O_CLOEXEC);
    }

    static void LevelWrite(int fd)
    {
        EXPECT_EQ(write(fd, "raid1\n", 6), 6);
        (void)close(fd);
    }
};

// --- what is answered --------------------------------------------------------------------------

constexpr const char *REFUSAL = "health errno 22\nsync errno 22\n";

struct SHAPE {
    const char *szName;
    const char *szClient;
    // A loop device's own answer, EINVAL or, to a program of another kind than the kernel, ENOTTY.
    const char *szRefusal;
};

struct MdRequestsShape : MdRequests, testing::WithParamInterface<SHAPE> {
};

TEST_P(MdRequestsShape, GetsBothAnswersAndNothingBesideThem)
{
    const char *const szClient = GetParam().szClient;
    ExpectExit(Launch(Client(szClient, {"open", Node(0), "health", "sync"})), 0,
               "health 1\nsync 1 65536 130944\n");
    ExpectExit(Launch(Client(szClient, {"open", Node(1), "health", "sync"})), 0,
               "health 0\nsync 0 0 0\n");
}

TEST_P(MdRequestsShape, WhatIsNoArrayIsAnsweredByTheKernel)
{
    // 25 is ENOTTY, 9 EBADF.
    const char *const szClient = GetParam().szClient;
    ExpectExit(Launch(Client(szClient, {"open", Node(2), "health", "sync"})), 0,
               GetParam().szRefusal);
    ExpectExit(Launch(Client(szClient, {"open", "/dev/null", "health", "close", "health"})), 0,
               "health errno 25\nhealth errno 9\n");
}

TEST_P(MdRequestsShape, WithoutTheLauncherThereIsNoAnswer)
{
    ExpectExit(End(Start(Client(GetParam().szClient, {"open", Node(0), "health", "sync"}))), 0,
               GetParam().szRefusal);
}

INSTANTIATE_TEST_SUITE_P(Programs, MdRequestsShape,
                         testing::Values(SHAPE{"Shared", CLIENT_SHARED, REFUSAL},
                                         SHAPE{"Static", CLIENT_STATIC, REFUSAL},
                                         SHAPE{"Of32Bits", CLIENT_32,
                                               "health errno 25\nsync errno 25\n"}),
                         [](const auto &shape) { return shape.param.szName; });

TEST_F(MdRequests, OtherRequestsPass)
{
    ExpectExit(Launch(Client(CLIENT, {"open", Node(0), "size"})), 0, "size 0 0\n");
}

TEST_F(MdRequests, AnAnswerWithoutAPlaceIsABadAddress)
{
    ExpectExit(Launch(Client(CLIENT, {"open", Node(0), "null"})), 0, "null -1 errno 14\n");
}

TEST_F(MdRequests, AnArrayThatDoesNotRunIsNoDevice)
{
    for (const char *szState : {"clear\n", "inactive\n"}) {
        Write(Folder(0) + "/array_state", szState);
        ExpectExit(Launch(Client(CLIENT, {"open", Node(0), "health", "sync"})), 0,
                   "health errno 19\nsync errno 19\n");
    }
}

TEST_F(MdRequests, AnArrayThatVanishesBeforeTheAnswerIsNoDevice)
{
    LevelHold(0);
    const STARTED started = Start({LAUNCHER, CLIENT, "open", Node(0), "health"});
    const int fdLevel = LevelOpen(0);
    std::filesystem::remove(Folder(0) + "/array_state");
    LevelWrite(fdLevel);
    ExpectExit(End(started), 0, "health errno 19\n");
    ExpectServersEnd(1);
}

TEST_F(MdRequests, ADescriptorStandsForWhatItIsAtTheMoment)
{
    ExpectExit(Launch(Client(CLIENT, {"open", Node(0), "health", "close", "open", Node(1), "health",
                                      "close", "open", "/dev/null", "health", "close", "open",
                                      Node(0), "health"})),
               0, "health 1\nhealth 0\nhealth errno 25\nhealth 1\n");
}

// --- who is answered ---------------------------------------------------------------------------

TEST_F(MdRequests, AChildOfAChildIsAnswered)
{
    ExpectExit(Launch(Client(CLIENT, {"fork", "fork", "open", Node(0), "health"})), 0,
               "health 1\n");
    ExpectExit(
        Launch({"sh", "-c", string(CLIENT_STATIC) + " fork open " + Node(0) + " sync; exit 3"}), 3,
        "sync 1 65536 130944\n");
}

TEST_F(MdRequests, TwoProgramsOfOneLauncherAskAtOnce)
{
    const string szAsk = string(CLIENT) + " open " + Node(0) + " times 500";
    ExpectExit(Launch({"sh", "-c", szAsk + " & " + szAsk + "; wait"}), 0, "times 500\ntimes 500\n");
}

TEST_F(MdRequests, ALauncherDoesNotWaitForAnother)
{
    LevelHold(0);
    const STARTED held = Start({LAUNCHER, CLIENT, "open", Node(0), "health"});
    const int fdLevel = LevelOpen(0);
    ExpectExit(End(Start({LAUNCHER, CLIENT, "open", Node(1), "health"})), 0, "health 0\n");
    LevelWrite(fdLevel);
    ExpectExit(End(held), 0, "health 1\n");
    ExpectServersEnd(2);
}

TEST_F(MdRequests, AProgramThatIsKilledInARequestLeavesTheOthersTheirAnswers)
{
    LevelHold(0);
    ASSERT_EQ(mkfifo((Folder(1) + "/word").c_str(), 0600), 0);
    const string szClient = CLIENT;
    const STARTED started =
        Start({LAUNCHER, "sh", "-c",
               "exec 2>&-; echo $$; " + szClient + " open " + Node(0) + " health & read word <" +
                   Folder(1) + "/word; kill -9 $!; wait $!; echo $?; " + szClient + " open " +
                   Node(1) + " health"});
    const int fdLevel = LevelOpen(0);
    Write(Folder(1) + "/word", "go\n");
    // Nothing is answered before the level is there, and then the first program is gone.
    std::array<char, 64> first = {};
    string out;
    while (out.find("137\n") == string::npos) {
        const ssize_t cb = read(started.fdOut, first.data(), first.size());
        ASSERT_GT(cb, 0) << out;
        out.append(first.data(), static_cast<size_t>(cb));
    }
    LevelWrite(fdLevel);
    ExpectExit(End(started), 0, "health 0\n");
    EXPECT_EQ(out, std::to_string(started.pid) + "\n137\n");
    ExpectServersEnd(1);
}

TEST_F(MdRequests, AProgramThatOutlivesTheFirstIsStillAnswered)
{
    LevelHold(0);
    const string szAnswer = Folder(1) + "/answer";
    const STARTED started = Start({LAUNCHER, "sh", "-c",
                                   string(CLIENT) + " open " + Node(0) + " health close open " +
                                       Node(1) + " health >" + szAnswer + " 2>&1 & exit 4"});
    // The end of its output is seen although the other one still runs.
    ExpectExit(End(started), 4, "");
    LevelWrite(LevelOpen(0));
    ExpectServersEnd(2); // the program is an orphan, too
    std::ifstream stream(szAnswer);
    const string answer((std::istreambuf_iterator<char>(stream)), {});
    EXPECT_EQ(answer, "health 1\nhealth 0\n");
}

TEST_F(MdRequests, WithoutItsServerAProgramGoesOnWithoutAnswers)
{
    LevelHold(0);
    const STARTED started = Start({LAUNCHER, CLIENT, "open", Node(0), "health", "sync"});
    const int fdLevel = LevelOpen(0);
    std::ifstream children("/proc/thread-self/children");
    pid_t first = 0;
    pid_t second = 0;
    children >> first >> second;
    EXPECT_EQ(kill(first == started.pid ? second : first, SIGKILL), 0);
    // 38 is ENOSYS.
    ExpectExit(End(started), 0, "health errno 38\nsync errno 38\n");
    EXPECT_GT(waitpid(-1, nullptr, 0), 0);
    (void)close(fdLevel);
}

TEST_F(MdRequests, UnderAnotherLauncherTheAnswersAreTheSame)
{
    ExpectExit(Launch({LAUNCHER, CLIENT, "open", Node(0), "health", "sync"}, 2), 0,
               "health 1\nsync 1 65536 130944\n");
}

// --- the program is as if it had been started directly -----------------------------------------

TEST_F(MdRequests, EndsAsTheProgramEnds)
{
    for (const int status : {0, 1, 7, 125, 255}) {
        ExpectExit(Launch({"sh", "-c", "exit " + std::to_string(status)}), status, "");
    }
    for (const int signal : {SIGKILL, SIGTERM, SIGSEGV}) {
        const RESULT result = Launch({"sh", "-c", "kill -" + std::to_string(signal) + " $$"});
        EXPECT_TRUE(WIFSIGNALED(result.status) && WTERMSIG(result.status) == signal)
            << result.status;
    }
}

TEST_F(MdRequests, SignalsReachTheProgram)
{
    const STARTED started =
        Start({LAUNCHER, "sh", "-c",
               "trap 'echo told; exit 5' USR1; echo $$; while :; do sleep 0.1; done"});
    std::array<char, 64> line = {};
    ASSERT_GT(read(started.fdOut, line.data(), line.size() - 1), 0);
    EXPECT_EQ(string(line.data()), std::to_string(started.pid) + "\n");
    EXPECT_EQ(kill(started.pid, SIGUSR1), 0);
    ExpectExit(End(started), 5, "told\n");
    ExpectServersEnd(1);
}

TEST_F(MdRequests, TheProgramInheritsNoDescriptorAndHasNoChild)
{
    const RESULT direct = End(Start(Client(CLIENT, {"files"})));
    EXPECT_EQ(direct.out.rfind("file 0\nfile 1\nfile 2\n", 0), 0U) << direct.out;
    ExpectExit(Launch(Client(CLIENT, {"files"})), 0, direct.out);
    ExpectExit(Launch({"sh", "-c", "read children </proc/$$/task/$$/children; echo [$children]"}),
               0, "[]\n");
}

TEST_F(MdRequests, WhatIsPreloadedStaysSo)
{
    ASSERT_EQ(setenv("LD_PRELOAD", "libc.so.6", 1), 0);
    ExpectExit(Launch({"sh", "-c", "echo $LD_PRELOAD"}), 0, "libc.so.6\n");
    ASSERT_EQ(unsetenv("LD_PRELOAD"), 0);
}

TEST_F(MdRequests, WithoutStreamsItServesAsWell)
{
    const string szAnswer = Folder(1) + "/answer";
    ExpectExit(End(Start({"sh", "-c",
                          "exec " + string(LAUNCHER) + " sh -c '" + CLIENT + " open " + Node(0) +
                              " health >" + szAnswer + "' <&- >&- 2>&-"})),
               0, "");
    ExpectServersEnd(1);
    std::ifstream stream(szAnswer);
    const string answer((std::istreambuf_iterator<char>(stream)), {});
    EXPECT_EQ(answer, "health 1\n");
}

// --- what cannot be started --------------------------------------------------------------------

TEST_F(MdRequests, AProgramThatIsNotThereIs127)
{
    ExpectExit(Launch({"no-such-program"}), 127,
               "mdrequests: no-such-program: No such file or directory\n");
}

TEST_F(MdRequests, AProgramThatCannotBeExecutedIs126)
{
    ExpectExit(Launch({"/etc"}), 126, "mdrequests: /etc: Permission denied\n");
}

TEST_F(MdRequests, WithoutAProgramThereIsTheUsage)
{
    const string szUsage = "usage: mdrequests PROGRAM [ARGUMENT...]\n";
    ExpectExit(End(Start({LAUNCHER})), 125, szUsage);
    ExpectExit(End(Start({LAUNCHER, "--help"})), 125, szUsage);
}

TEST_F(MdRequests, AnOldKernelIsNamedAndNothingIsStarted)
{
    // 22 is EINVAL, 38 ENOSYS; the last one notifies, but cannot tell when all programs are gone.
    for (const WORDS &words :
         {WORDS{"seccomp", "22"}, WORDS{"seccomp", "38"}, WORDS{"addfd", "22"}}) {
        ExpectExit(
            End(Start({CLIENT, "deny", words[0], words[1], "exec", LAUNCHER, "echo", "started"})),
            125, OLD_KERNEL);
        ExpectServersEnd(words[0] == "addfd" ? 1 : 0);
    }
}

} // namespace
