// SPDX-License-Identifier: MIT
#include "nurocore/process.h"

#include "last_error.h"
#include "lock_file.h"
#include "test_child.h"
#include "test_files.h"

#include <cstdlib>
#include <cstring>
#include <pthread.h>
#include <string>
#include <utility>

namespace
{

constexpr char SHELL[] = "/bin/sh";
constexpr char DEV_NULL[] = "/dev/null";
constexpr char MISSING_PROGRAM[] = "/nonexistent/program";

static_assert(FORK_RUN_AND_WAIT == 0xBB);

// --- what a child of NLIBCFork leaves behind

std::string EnvironmentText()
{
    std::string text;
    for (char **pp = environ; pp != nullptr && *pp != nullptr; pp++) {
        text += std::string(*pp) + "\n";
    }
    return text;
}

TEST(Fork, WithoutFlagsGivesPidAndZero)
{
    const int pid = NLIBCFork(0);
    if (pid == 0) {
        ChildEnd(getppid() > 1 ? 17 : 1);
    }
    ASSERT_GT(pid, 0);
    const int status = WaitFor(pid);
    EXPECT_TRUE(WIFEXITED(status));
    EXPECT_EQ(WEXITSTATUS(status), 17);
}

// A file after a child that pFork makes and its parent have both closed it with a word in its
// buffer.
std::string ClosedByBoth(int (*pFork)())
{
    const TEST_FOLDER folder;
    const std::string path = folder.Path("buffered");
    FILE *const pFile = fopen(path.c_str(), "we");
    EXPECT_NE(pFile, nullptr);
    EXPECT_GE(fputs("word.", pFile), 0);
    const int pid = pFork();
    if (pid == 0) {
        (void)fclose(pFile);
        ChildEnd(0);
    }
    (void)WaitFor(pid);
    (void)fclose(pFile);
    return FileText(path);
}

// What a call returns and the code that it leaves when nothing can be forked.
std::string WithoutForks(int (*pCall)())
{
    return InChild([&] {
        ForkForbid();
        RecordReset();
        const int result = pCall();
        return std::to_string(result) + " " + std::to_string(NLIBCErrGet());
    });
}

TEST(Fork, FlushesWhatIsBufferedFirst)
{
    EXPECT_EQ(ClosedByBoth([] { return NLIBCFork(0); }), "word.");
}

TEST(Fork, TheEnvironmentIsResetToPath)
{
    const auto SeenWith = [](const char *szPath) {
        return InChild([&] {
            (void)clearenv();
            (void)setenv("HOME", "/root", 1);
            (void)setenv("LD_LIBRARY_PATH", "/lib", 1);
            if (szPath != nullptr) {
                (void)setenv("PATH", szPath, 1);
            }
            return InForkedChild(0x08, [] { return "[" + EnvironmentText() + "]"; });
        });
    };
    EXPECT_EQ(SeenWith("/sbin:/usr/sbin"), "[PATH=/sbin:/usr/sbin\n]");
    EXPECT_EQ(SeenWith(""), "[PATH=\n]");
    EXPECT_EQ(SeenWith(nullptr), "[]");
}

TEST(Fork, WithoutTheFlagTheEnvironmentStays)
{
    EXPECT_EQ(InChild([] {
                  (void)setenv("UNIT_TEST_WORD", "kept", 1);
                  return InForkedChild(0xFF & ~0x08U & ~0x04U & ~0x40U, [] {
                      const char *const szWord = getenv("UNIT_TEST_WORD");
                      return std::string(szWord == nullptr ? "" : szWord);
                  });
              }),
              "kept");
}

// Only root may raise its priority again.
TEST(Fork, ThePriorityIsReset)
{
    const auto SeenWith = [](unsigned int flags) {
        return InChild([&] {
            (void)setpriority(PRIO_PROCESS, 0, 5);
            return InForkedChild(flags,
                                 [] { return std::to_string(getpriority(PRIO_PROCESS, 0)); });
        });
    };
    EXPECT_EQ(SeenWith(0x80), geteuid() == 0 ? "0" : "5");
    EXPECT_EQ(SeenWith(0), "5");
}

TEST(Fork, LockFilesAreReleasedInTheChildAlone)
{
    const TEST_FOLDER folder;
    LOCK_FILE &lock = NLIBCLockFileTable()[0];
    lock.pStream = fopen(folder.Path("lock").c_str(), "we");
    lock.nHold = 3;
    ASSERT_NE(lock.pStream, nullptr);
    for (const auto &[flags, szSeen] :
         {std::pair(0x02U, "open 0 hold 0"), std::pair(0x00U, "open 1 hold 3"),
          std::pair(0xBBU & ~0x02U, "open 1 hold 3")}) {
        EXPECT_EQ(InForkedChild(flags,
                                [&] {
                                    return "open " + std::to_string(lock.pStream != nullptr) +
                                           " hold " + std::to_string(lock.nHold);
                                }),
                  szSeen);
    }
    EXPECT_NE(lock.pStream, nullptr);
    EXPECT_EQ(lock.nHold, 3);
    EXPECT_EQ(NLIBCLockFilesRelease(), 0);
}

TEST(Fork, StandardStreamsGoToDevNull)
{
    const auto Seen = [] {
        std::string text =
            DescriptorTarget(0) + " " + DescriptorTarget(1) + " " + DescriptorTarget(2);
        const int flags = fcntl(STDIN_FILENO, F_GETFL);
        return text + ((flags & O_ACCMODE) == O_RDWR ? " rw " : " ? ") +
               std::to_string(DescriptorCount());
    };
    // The child of InForkedChild has the report's two descriptors more.
    const std::string nDescriptor = std::to_string(DescriptorCount() + 2);
    EXPECT_EQ(InForkedChild(0x01, Seen), "/dev/null /dev/null /dev/null rw " + nDescriptor);
}

TEST(Fork, StandardStreamsThatWereClosedAreOpenedOnDevNull)
{
    EXPECT_EQ(InChild([] {
                  for (int fd = 0; fd < 3; fd++) {
                      (void)close(fd);
                  }
                  REPORT report; // takes the low numbers, which the child then loses
                  const int fdKept = fcntl(report.fd[1], F_DUPFD_CLOEXEC, 10);
                  (void)close(report.fd[1]);
                  report.fd[1] = fdKept;
                  const int pid = NLIBCFork(0x01);
                  if (pid == 0) {
                      report.Write(DescriptorTarget(0) + DescriptorTarget(1) + DescriptorTarget(2));
                      ChildEnd(0);
                  }
                  std::string text = report.Read();
                  (void)WaitFor(pid);
                  return text;
              }),
              "/dev/null/dev/null/dev/null");
}

// A low limit keeps this quick: the descriptors to close are counted by it.
TEST(Fork, DescriptorsFrom3UpAreClosed)
{
    const TEST_FOLDER folder;
    const std::string path = folder.Path("lock");
    EXPECT_EQ(InChild([&] {
                  constexpr rlimit few = {64, 64};
                  (void)setrlimit(RLIMIT_NOFILE, &few);
                  LOCK_FILE &lock = NLIBCLockFileTable()[1];
                  lock.pStream = fopen(path.c_str(), "we");
                  lock.nHold = 1;
                  (void)dup2(STDIN_FILENO, 63);
                  const int pid = NLIBCFork(0x04);
                  if (pid == 0) {
                      int nOpen = 0;
                      for (int fd = 3; fd < 64; fd++) {
                          nOpen += fcntl(fd, F_GETFD) != -1 ? 1 : 0;
                      }
                      const bool fStandard = fcntl(0, F_GETFD) != -1 && fcntl(1, F_GETFD) != -1 &&
                                             fcntl(2, F_GETFD) != -1;
                      const bool fReleased = lock.pStream == nullptr && lock.nHold == 0;
                      ChildEnd(nOpen == 0 && fStandard && fReleased ? 0 : 1);
                  }
                  return std::to_string(WaitFor(pid));
              }),
              "0");
}

TEST(Fork, ASessionAndTheRootFolderOnDemand)
{
    const auto Seen = [] {
        return std::string(getsid(0) == getpid() ? "own" : "inherited") + " session in " +
               std::filesystem::current_path().string();
    };
    const std::string here = std::filesystem::current_path().string();
    EXPECT_EQ(InForkedChild(0, Seen), "inherited session in " + here);
    EXPECT_EQ(InForkedChild(0x20, Seen), "own session in " + here);
    EXPECT_EQ(InForkedChild(0x10, Seen), "inherited session in /");
    EXPECT_EQ(InForkedChild(0x30, Seen), "own session in /");
}

TEST(Fork, FailureSetsItsCode)
{
    EXPECT_EQ(WithoutForks([] { return NLIBCFork(0xBB); }), "-1 " + std::to_string(0x9700));
}

// --- daemonising

TEST(Daemonize, AGrandchildGoesOn)
{
    REPORT report;
    const pid_t pidTest = getpid();
    const int result = NLIBCFork(0x40 | 0x20);
    if (result == 0) {
        report.Write(std::string(getppid() != pidTest ? "grandchild" : "child") +
                     (getsid(0) == getpid() ? " leads" : " follows"));
        ChildEnd(3);
    }
    EXPECT_EQ(result, 1);
    EXPECT_EQ(report.Read(), "grandchild leads");
    EXPECT_EQ(waitpid(-1, nullptr, WNOHANG), -1) << "nothing is left to wait for";
    EXPECT_EQ(errno, ECHILD);
}

void AtForkKill()
{
    (void)raise(SIGKILL);
}

void AtForkFail()
{
    _exit(3);
}

// Puts the next fork, which is the first child's own, out of reach.
void AtForkForbid()
{
    constexpr rlimit none = {0, 0};
    (void)setrlimit(RLIMIT_NPROC, &none);
}

void AtForkDawdle()
{
    (void)usleep(30000);
}

void Ignore(int)
{
}

// What the parent is told when pHandler runs in the first child.
std::string DaemonizedWith(void (*pHandler)())
{
    return InChild([&] {
        if (pHandler == AtForkForbid && geteuid() == 0) {
            (void)!setresuid(65534, 65534, 65534);
        }
        (void)pthread_atfork(nullptr, nullptr, pHandler);
        const int result = NLIBCFork(0x40);
        if (result == 0) {
            ChildEnd(0);
        }
        return std::to_string(result);
    });
}

TEST(Daemonize, AFirstChildThatEndsOtherwiseIsAFailure)
{
    EXPECT_EQ(DaemonizedWith(AtForkKill), "-1");
    EXPECT_EQ(DaemonizedWith(AtForkFail), "-1");
    EXPECT_EQ(DaemonizedWith(AtForkForbid), "-1") << "the second fork fails";
}

TEST(Daemonize, AFirstChildReapedElsewhereIsASuccess)
{
    const SIGNAL_SCOPE ignored(SIGCHLD, SIG_IGN);
    const int result = NLIBCFork(0x40);
    if (result == 0) {
        ChildEnd(0);
    }
    EXPECT_EQ(result, 1);
}

TEST(Daemonize, WaitsThroughInterruptions)
{
    EXPECT_EQ(InChild([] {
                  const INTERRUPTION_SCOPE interruption(Ignore);
                  (void)pthread_atfork(nullptr, nullptr, AtForkDawdle);
                  const int result = NLIBCFork(0x40);
                  if (result == 0) {
                      ChildEnd(0);
                  }
                  return std::to_string(result);
              }),
              "1");
}

// --- run and wait

int RunShell(const char *szCommand)
{
    return NLIBCExecl(SHELL, "-c", szCommand, nullptr);
}

TEST(Execl, GivesTheExitStatus)
{
    EXPECT_QUIET(RunShell("exit 0"), 0);
    EXPECT_QUIET(RunShell("exit 3"), 3);
    EXPECT_QUIET(RunShell("exit 255"), 255);
    EXPECT_QUIET(NLIBCExecl("/bin/true", nullptr), 0);
}

TEST(Execl, AMissingProgramIs255)
{
    EXPECT_QUIET(NLIBCExecl(MISSING_PROGRAM, "argument", nullptr), 255);
    EXPECT_QUIET(NLIBCExecl("/", nullptr), 255);
    EXPECT_QUIET(NLIBCExecl("sh", "-c", "exit 0", nullptr), 255); // PATH is not searched
}

TEST(Execl, AKilledProgramIsAFailure)
{
    EXPECT_FAILS(RunShell("kill -9 $$"), -1, ERR_CHILD_FAILED);
    EXPECT_FAILS(RunShell("kill -15 $$"), -1, ERR_CHILD_FAILED);
}

TEST(Execl, AFailedForkIsAChildThatFailed)
{
    EXPECT_EQ(WithoutForks([] { return RunShell("exit 0"); }), "-1 " + std::to_string(0x2A00));
}

// The program writes what it sees of itself into a file, its own output being /dev/null.
TEST(Execl, HandsOverThePathAndEveryArgument)
{
    const TEST_FOLDER folder;
    const std::string path = folder.Path("seen");
    constexpr char COMMAND[] = "tr '\\0' '|' </proc/$$/cmdline >\"$0\"";
    EXPECT_EQ(NLIBCExecl(SHELL, "-c", COMMAND, path.c_str(), "two words", "", "*", nullptr), 0);
    EXPECT_EQ(FileText(path),
              std::string(SHELL) + "|-c|" + COMMAND + "|" + path + "|two words||*|");
}

TEST(Execl, RunsInACleanPlace)
{
    const TEST_FOLDER folder;
    const std::string path = folder.Path("seen");
    constexpr char COMMAND[] = "a=$(readlink /proc/$$/fd/0 /proc/$$/fd/1 /proc/$$/fd/2)\n"
                               "b=$(readlink /proc/$$/cwd)\n"
                               "c=$(tr '\\0' ' ' </proc/$$/environ)\n"
                               "d=$(cut -d ' ' -f 6 /proc/$$/stat)\n"
                               "[ \"$d\" = $$ ] && d=own\n"
                               "echo $a $b \"$c\" $d >\"$0\"\n";
    EXPECT_EQ(InChild([&] {
                  (void)clearenv();
                  (void)setenv("PATH", "/usr/bin:/bin", 1);
                  (void)setenv("LC_ALL", "C", 1);
                  return std::to_string(NLIBCExecl(SHELL, "-c", COMMAND, path.c_str(), nullptr));
              }),
              "0");
    EXPECT_EQ(FileText(path), "/dev/null /dev/null /dev/null / PATH=/usr/bin:/bin  own\n");
}

TEST(Execl, ReleasesTheLockFilesInTheChild)
{
    const TEST_FOLDER folder;
    LOCK_FILE &lock = NLIBCLockFileTable()[2];
    lock.pStream = fopen(folder.Path("lock").c_str(), "w"); // would survive the exec
    ASSERT_NE(lock.pStream, nullptr);
    const std::string fd = std::to_string(fileno(lock.pStream));
    EXPECT_EQ(
        NLIBCExecl(SHELL, "-c", "[ -e /proc/$$/fd/$0 ] && exit 1; exit 0", fd.c_str(), nullptr), 0);
    EXPECT_NE(lock.pStream, nullptr);
    EXPECT_EQ(NLIBCLockFilesRelease(), 0);
}

TEST(Execl, AProgramReapedElsewhereGives0)
{
    const SIGNAL_SCOPE ignored(SIGCHLD, SIG_IGN);
    EXPECT_QUIET(RunShell("exit 3"), 0);
    EXPECT_QUIET(NLIBCExecl(MISSING_PROGRAM, nullptr), 0);
}

int ChildSignalFlags()
{
    struct sigaction action = {};
    (void)sigaction(SIGCHLD, nullptr, &action);
    return action.sa_flags;
}

TEST(Execl, WaitsInSpiteOfNoChildWaitAndSetsItAgain)
{
    const SIGNAL_SCOPE noWait(SIGCHLD, SIG_DFL, SA_NOCLDWAIT);
    ASSERT_NE(ChildSignalFlags() & SA_NOCLDWAIT, 0);
    EXPECT_QUIET(RunShell("exit 3"), 3);
    EXPECT_NE(ChildSignalFlags() & SA_NOCLDWAIT, 0);
    EXPECT_FAILS(RunShell("kill -9 $$"), -1, ERR_CHILD_FAILED);
    EXPECT_NE(ChildSignalFlags() & SA_NOCLDWAIT, 0);
    EXPECT_FAILS(NLIBCExecl(nullptr, nullptr), -1, ERR_BAD_PARAMETER);
    EXPECT_NE(ChildSignalFlags() & SA_NOCLDWAIT, 0);
}

TEST(Execl, KeepsTheOtherHalfOfTheDisposition)
{
    const SIGNAL_SCOPE handled(SIGCHLD, Ignore, SA_NOCLDWAIT | SA_RESTART);
    EXPECT_QUIET(RunShell("exit 4"), 4);
    struct sigaction action = {};
    (void)sigaction(SIGCHLD, nullptr, &action);
    EXPECT_EQ(action.sa_handler, Ignore);
    EXPECT_EQ(action.sa_flags & (SA_NOCLDWAIT | SA_RESTART), SA_NOCLDWAIT | SA_RESTART);
}

TEST(Execl, AFailedForkSetsNoChildWaitAgain)
{
    EXPECT_EQ(InChild([] {
                  const SIGNAL_SCOPE noWait(SIGCHLD, SIG_DFL, SA_NOCLDWAIT);
                  ForkForbid();
                  (void)RunShell("exit 0");
                  return std::string((ChildSignalFlags() & SA_NOCLDWAIT) != 0 ? "set" : "lost");
              }),
              "set");
}

TEST(Execl, WaitsThroughInterruptions)
{
    const INTERRUPTION_SCOPE interruption(Ignore);
    EXPECT_QUIET(RunShell("sleep 0.05; exit 7"), 7);
}

// --- workers

TEST(ForkCloseIo, PointsTheStandardStreamsAtDevNull)
{
    REPORT report;
    const int nDescriptor = DescriptorCount();
    const int pid = NLIBCForkCloseIo();
    if (pid == 0) {
        report.Write(DescriptorTarget(0) + " " + DescriptorTarget(1) + " " + DescriptorTarget(2) +
                     " " + std::to_string(DescriptorCount()));
        ChildEnd(9);
    }
    ASSERT_GT(pid, 0);
    EXPECT_EQ(report.Read(), "/dev/null /dev/null /dev/null " + std::to_string(nDescriptor));
    const int status = WaitFor(pid);
    EXPECT_EQ(WEXITSTATUS(status), 9);
    EXPECT_NE(DescriptorTarget(1), DEV_NULL) << "the parent's streams stay";
}

TEST(ForkCloseIo, DoesNotFlush)
{
    EXPECT_EQ(ClosedByBoth(NLIBCForkCloseIo), "word.word.");
}

TEST(ForkCloseIo, FailureSetsNoCode)
{
    EXPECT_EQ(WithoutForks(NLIBCForkCloseIo), "-1 " + std::to_string(OLD_CODE));
}

} // namespace
