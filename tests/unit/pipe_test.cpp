// SPDX-License-Identifier: MIT
#include "nurocore/pipe.h"

#include "last_error.h"
#include "test_child.h"
#include "test_files.h"

#include <initializer_list>
#include <utility>

namespace
{

constexpr char SHELL[] = "/bin/sh";
constexpr char MISSING_PROGRAM[] = "/nonexistent/program";

FILE *PopenShell(const char *szMode, const char *szCommand)
{
    return NLIBCPopen(SHELL, szMode, "-c", szCommand, nullptr);
}

std::string TextOf(FILE *pStream)
{
    std::string text;
    for (int ch = fgetc(pStream); ch != EOF; ch = fgetc(pStream)) {
        text += static_cast<char>(ch);
    }
    return text;
}

// What comes through the stream, and the raw status it ends with.
std::string ReadAndClose(FILE *pStream)
{
    if (pStream == nullptr) {
        return "no stream";
    }
    const std::string text = TextOf(pStream);
    return text + "[" + std::to_string(NLIBCPclose(pStream)) + "]";
}

// --- reading

constexpr char SPEAK_BOTH[] = "echo out; echo err >&2; exit 1";

TEST(Popen, ReadsTheOutputTheModeAsksFor)
{
    for (const char *szMode : {"r", "re", "rp", "rr", "pr", "er"}) {
        EXPECT_EQ(ReadAndClose(PopenShell(szMode, SPEAK_BOTH)), "out\n[256]") << szMode;
    }
    for (const char *szMode : {"rE", "Er", "rEB", "rBE", "rEe"}) {
        EXPECT_EQ(ReadAndClose(PopenShell(szMode, SPEAK_BOTH)), "err\n[256]") << szMode;
    }
    for (const char *szMode : {"rB", "Br", "rBBp"}) {
        EXPECT_EQ(ReadAndClose(PopenShell(szMode, SPEAK_BOTH)), "out\nerr\n[256]") << szMode;
    }
}

// Which of the program's standard streams is the pipe; it tells through whatever it has.
TEST(Popen, WhatIsNotPipedIsDevNull)
{
    constexpr char COMMAND[] = "a=$(readlink /proc/$$/fd/0 /proc/$$/fd/1 /proc/$$/fd/2)\n"
                               "for x in $a; do s=\"$s ${x%%:*}\"; done\n"
                               "[ \"$0\" = 1 ] && echo $s || echo $s >&2\n";
    const auto Seen = [&](const char *szMode, const char *szSpeaker) {
        return ReadAndClose(NLIBCPopen(SHELL, szMode, "-c", COMMAND, szSpeaker, nullptr));
    };
    EXPECT_EQ(Seen("r", "1"), "/dev/null pipe /dev/null\n[0]");
    EXPECT_EQ(Seen("rE", "2"), "/dev/null /dev/null pipe\n[0]");
    EXPECT_EQ(Seen("rB", "1"), "/dev/null pipe pipe\n[0]");
    EXPECT_EQ(Seen("rB", "2"), "/dev/null pipe pipe\n[0]");
    EXPECT_EQ(Seen("rEB", "2"), "/dev/null /dev/null pipe\n[0]");
}

TEST(Popen, HandsOverThePathEveryArgumentAndTheEnvironment)
{
    constexpr char COMMAND[] = "tr '\\0' '|' </proc/$$/cmdline; echo $UNIT_TEST_WORD";
    EXPECT_EQ(InChild([&] {
                  (void)setenv("UNIT_TEST_WORD", "kept", 1);
                  return ReadAndClose(
                      NLIBCPopen(SHELL, "r", "-c", COMMAND, "two words", "", "*", nullptr));
              }),
              std::string(SHELL) + "|-c|" + COMMAND + "|two words||*|kept\n[0]");
}

TEST(Popen, TakesNoMoreArgumentsThanThePath)
{
    EXPECT_EQ(ReadAndClose(NLIBCPopen("/bin/true", "r", nullptr)), "[0]");
}

TEST(Popen, ReadsMoreThanAPipeHolds)
{
    const std::string text = ReadAndClose(PopenShell("r", "yes 0123456789 | head -n 100000"));
    EXPECT_EQ(text.size(), 1100003U);
}

TEST(PopenV, TakesTheCallersVector)
{
    char szName[] = "another-name";
    char szOption[] = "-c";
    char szCommand[] = "tr '\\0' '|' </proc/$$/cmdline";
    char *argv[] = {szName, szOption, szCommand, nullptr};
    EXPECT_EQ(ReadAndClose(NLIBCPopenV(SHELL, "r", argv)),
              "another-name|-c|tr '\\0' '|' </proc/$$/cmdline|[0]");
    EXPECT_STREQ(argv[0], "another-name");
    EXPECT_EQ(argv[3], nullptr);
}

// --- writing

TEST(Popen, WritesWhatTheProgramReads)
{
    const TEST_FOLDER folder;
    for (const char *szMode : {"w", "we", "wp", "ww", "wE", "wB"}) {
        const std::string path = folder.Path(szMode);
        FILE *const pStream =
            NLIBCPopen(SHELL, szMode, "-c", "cat >\"$0\"; exit 2", path.c_str(), nullptr);
        ASSERT_NE(pStream, nullptr) << szMode;
        EXPECT_GE(fputs("spoken", pStream), 0);
        EXPECT_EQ(NLIBCPclose(pStream), 2 << 8);
        EXPECT_EQ(FileText(path), "spoken") << "closing ends the program's input";
    }
}

TEST(Popen, AWrittenProgramSpeaksToDevNull)
{
    const TEST_FOLDER folder;
    const std::string path = folder.Path("seen");
    constexpr char COMMAND[] = "a=$(readlink /proc/$$/fd/0 /proc/$$/fd/1 /proc/$$/fd/2)\n"
                               "for x in $a; do s=\"$s ${x%%:*}\"; done\n"
                               "echo $s >\"$0\"\n";
    FILE *const pStream = NLIBCPopen(SHELL, "w", "-c", COMMAND, path.c_str(), nullptr);
    ASSERT_NE(pStream, nullptr);
    EXPECT_EQ(NLIBCPclose(pStream), 0);
    EXPECT_EQ(FileText(path), "pipe /dev/null /dev/null\n");
}

// --- bad arguments

TEST(Popen, RefusesModesThatMeanNothing)
{
    const int nDescriptor = DescriptorCount();
    for (const char *szMode : {"", "rw", "wr", "rEw", "e", "p", "E", "B", "x", "rx", "r ", "R", "W",
                               "rb", "r+", "w+", "ra", "r,"}) {
        SCOPED_TRACE(szMode);
        EXPECT_FAILS(NLIBCPopen("/bin/true", szMode, nullptr), nullptr, ERR_BAD_PARAMETER);
        char szName[] = "true";
        char *argv[] = {szName, nullptr};
        EXPECT_FAILS(NLIBCPopenV("/bin/true", szMode, argv), nullptr, ERR_BAD_PARAMETER);
    }
    EXPECT_EQ(DescriptorCount(), nDescriptor);
}

// --- failures

TEST(Popen, WithoutDescriptorsThereIsNoPipe)
{
    EXPECT_EQ(InChild([] {
                  constexpr rlimit none = {3, 3};
                  (void)setrlimit(RLIMIT_NOFILE, &none);
                  RecordReset();
                  FILE *const pStream = NLIBCPopen("/bin/true", "r", nullptr);
                  return std::string(pStream == nullptr ? "none " : "some ") +
                         std::to_string(NLIBCErrGet());
              }),
              "none " + std::to_string(0x8100));
}

TEST(Popen, AFailedForkLeavesNothingOpen)
{
    for (const char *szMode : {"r", "w"}) {
        EXPECT_EQ(InChild([&] {
                      ForkForbid();
                      const int nDescriptor = DescriptorCount();
                      FILE *const pStream = NLIBCPopen("/bin/true", szMode, nullptr);
                      return std::string(pStream == nullptr ? "none " : "some ") +
                             std::to_string(NLIBCErrGet()) + " " +
                             std::to_string(DescriptorCount() - nDescriptor);
                  }),
                  "none " + std::to_string(0x9700) + " 0");
    }
}

TEST(Popen, AMissingProgramIsExitStatus127)
{
    EXPECT_EQ(ReadAndClose(NLIBCPopen(MISSING_PROGRAM, "r", "argument", nullptr)),
              "[" + std::to_string(127 << 8) + "]");
    EXPECT_EQ(ReadAndClose(NLIBCPopen("sh", "r", "-c", "exit 0", nullptr)),
              "[" + std::to_string(127 << 8) + "]"); // PATH is not searched
}

// --- descriptors

TEST(Popen, TheStreamIsCloseOnExecOnDemand)
{
    for (const auto &[szMode, flag] : {std::pair("r", 0), std::pair("re", FD_CLOEXEC),
                                       std::pair("w", 0), std::pair("we", FD_CLOEXEC)}) {
        FILE *const pStream = NLIBCPopen("/bin/true", szMode, nullptr);
        ASSERT_NE(pStream, nullptr);
        EXPECT_EQ(fcntl(fileno(pStream), F_GETFD), flag) << szMode;
        EXPECT_EQ(NLIBCPclose(pStream), 0);
    }
}

// Everything a program has open, a line each.
constexpr char LIST_DESCRIPTORS[] = "for f in /proc/$$/fd/*; do readlink $f; done";

TEST(Popen, AProgramSeesNoOtherStream)
{
    FILE *const pCat = NLIBCPopen("/bin/cat", "w", nullptr);
    FILE *const pSleep = PopenShell("rp", "read x </dev/null; echo done");
    ASSERT_NE(pCat, nullptr);
    ASSERT_NE(pSleep, nullptr);
    const std::string catPipe = DescriptorTarget(fileno(pCat));
    const std::string sleepPipe = DescriptorTarget(fileno(pSleep));
    ASSERT_EQ(catPipe.rfind("pipe:", 0), 0U);

    FILE *const pList = PopenShell("r", LIST_DESCRIPTORS);
    ASSERT_NE(pList, nullptr);
    const std::string ownPipe = DescriptorTarget(fileno(pList));
    const std::string seen = ReadAndClose(pList);
    EXPECT_EQ(seen.find(catPipe), std::string::npos) << seen;
    EXPECT_EQ(seen.find(sleepPipe), std::string::npos) << seen;
    EXPECT_NE(seen.find(ownPipe), std::string::npos) << seen;
    EXPECT_EQ(seen.find(ownPipe), seen.rfind(ownPipe)) << "its own pipe once:\n" << seen;

    EXPECT_EQ(ReadAndClose(pSleep), "done\n[0]");
    EXPECT_EQ(NLIBCPclose(pCat), 0);
}

// The program that is started later must not keep the earlier one's input open.
TEST(Popen, AnEarlierProgramEndsWhileALaterOneRuns)
{
    FILE *const pCat = NLIBCPopen("/bin/cat", "w", nullptr);
    FILE *const pLater = PopenShell("r", "echo $$; exec sleep 10");
    ASSERT_NE(pCat, nullptr);
    ASSERT_NE(pLater, nullptr);
    int pidLater = 0;
    ASSERT_EQ(fscanf(pLater, "%d", &pidLater), 1);
    EXPECT_EQ(NLIBCPclose(pCat), 0);
    EXPECT_EQ(kill(pidLater, SIGTERM), 0) << "it has run on";
    EXPECT_EQ(NLIBCPclose(pLater), SIGTERM) << "it has not ended on its own";
}

// With standard streams closed the pipe's own ends get their numbers.
std::string SpokenWithClosed(std::initializer_list<int> closed, const char *szMode)
{
    return InChild([&] {
        for (const int fd : closed) {
            (void)close(fd);
        }
        return ReadAndClose(PopenShell(szMode, SPEAK_BOTH));
    });
}

TEST(Popen, APipeEndThatIsAStandardStreamAlreadyIsKept)
{
    // Closed 0 and 1: the program's end is 1. Closed 1 and 2: it is 2.
    EXPECT_EQ(SpokenWithClosed({0, 1}, "r"), "out\n[256]");
    EXPECT_EQ(SpokenWithClosed({0, 1}, "rE"), "err\n[256]");
    EXPECT_EQ(SpokenWithClosed({0, 1}, "rB"), "out\nerr\n[256]");
    EXPECT_EQ(SpokenWithClosed({1, 2}, "r"), "out\n[256]");
    EXPECT_EQ(SpokenWithClosed({1, 2}, "rE"), "err\n[256]");
    EXPECT_EQ(SpokenWithClosed({1, 2}, "rB"), "out\nerr\n[256]");
    EXPECT_EQ(SpokenWithClosed({0, 1, 2}, "r"), "out\n[256]");
    EXPECT_EQ(SpokenWithClosed({0, 2}, "rE"), "err\n[256]");
}

TEST(Popen, AWritePipeThatIsStandardInputAlreadyIsKept)
{
    const TEST_FOLDER folder;
    const std::string path = folder.Path("seen");
    EXPECT_EQ(InChild([&] {
                  (void)close(STDIN_FILENO);
                  FILE *const pStream =
                      NLIBCPopen(SHELL, "w", "-c", "cat >\"$0\"", path.c_str(), nullptr);
                  if (pStream == nullptr) {
                      return std::string("no stream");
                  }
                  (void)fputs("spoken", pStream);
                  return std::to_string(NLIBCPclose(pStream));
              }),
              "0");
    EXPECT_EQ(FileText(path), "spoken");
}

// A stream of the parent that has a standard number must not cost the next program that stream.
TEST(Popen, AnotherStreamWithAStandardNumberIsReplacedNotClosed)
{
    EXPECT_EQ(InChild([] {
                  (void)close(STDIN_FILENO);
                  FILE *const pFirst = PopenShell("r", "sleep 0.05; echo first");
                  const bool fIsInput = pFirst != nullptr && fileno(pFirst) == STDIN_FILENO;
                  const std::string second =
                      ReadAndClose(PopenShell("r", "readlink /proc/$$/fd/0"));
                  return std::to_string(fIsInput) + " " + second + " " + ReadAndClose(pFirst);
              }),
              "1 /dev/null\n[0] first\n[0]");
}

// --- closing

TEST(Pclose, GivesTheRawStatus)
{
    EXPECT_EQ(ReadAndClose(PopenShell("r", "exit 0")), "[0]");
    EXPECT_EQ(ReadAndClose(PopenShell("r", "exit 1")), "[256]");
    EXPECT_EQ(ReadAndClose(PopenShell("r", "exit 255")), "[65280]");
    EXPECT_EQ(ReadAndClose(PopenShell("r", "kill -9 $$")), "[9]");
    EXPECT_EQ(ReadAndClose(PopenShell("r", "kill -15 $$")), "[15]");
}

TEST(Pclose, LeavesNoDescriptorAndNoZombie)
{
    const int nDescriptor = DescriptorCount();
    for (const char *szMode : {"r", "rE", "rB", "w", "re", "we"}) {
        FILE *const pStream = NLIBCPopen("/bin/true", szMode, nullptr);
        ASSERT_NE(pStream, nullptr);
        EXPECT_EQ(DescriptorCount(), nDescriptor + 1) << "the program's end is closed here";
        EXPECT_QUIET(NLIBCPclose(pStream), 0);
    }
    EXPECT_EQ(DescriptorCount(), nDescriptor);
    EXPECT_EQ(waitpid(-1, nullptr, WNOHANG), -1);
    EXPECT_EQ(errno, ECHILD);
}

TEST(Pclose, ClosesOpenStreamsInAnyOrder)
{
    constexpr int ORDERS[][3] = {{0, 1, 2}, {2, 1, 0}, {1, 0, 2}, {1, 2, 0}};
    for (const auto &order : ORDERS) {
        FILE *streams[3] = {PopenShell("r", "echo a; exit 1"), PopenShell("r", "echo b; exit 2"),
                            PopenShell("r", "echo c; exit 3")};
        constexpr const char *EXPECTED[] = {"a\n[256]", "b\n[512]", "c\n[768]"};
        for (const int i : order) {
            EXPECT_EQ(ReadAndClose(streams[i]), EXPECTED[i]);
        }
    }
}

TEST(Pclose, LeavesAForeignStreamOpen)
{
    const TEST_FOLDER folder;
    FILE *const pForeign = fopen(folder.Write("f", "text").c_str(), "re");
    FILE *const pOwn = PopenShell("r", "echo own");
    ASSERT_NE(pForeign, nullptr);
    EXPECT_FAILS(NLIBCPclose(pForeign), -1, ERR_NO_SUCH_CHILD);
    EXPECT_EQ(TextOf(pForeign), "text");
    EXPECT_EQ(fclose(pForeign), 0);
    EXPECT_EQ(ReadAndClose(pOwn), "own\n[0]");
}

TEST(Pclose, AProgramReapedElsewhereGives0)
{
    const SIGNAL_SCOPE ignored(SIGCHLD, SIG_IGN);
    FILE *const pStream = PopenShell("r", "exit 3");
    ASSERT_NE(pStream, nullptr);
    EXPECT_QUIET(NLIBCPclose(pStream), 0);
}

void Ignore(int)
{
}

TEST(Pclose, WaitsThroughInterruptions)
{
    FILE *const pStream = PopenShell("r", "sleep 0.05; exit 7");
    ASSERT_NE(pStream, nullptr);
    const INTERRUPTION_SCOPE interruption(Ignore);
    EXPECT_QUIET(NLIBCPclose(pStream), 7 << 8);
}

} // namespace
