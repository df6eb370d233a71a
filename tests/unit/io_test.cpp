// SPDX-License-Identifier: MIT
#include "nurocore/io.h"

#include "last_error.h"
#include "test_child.h"
#include "test_files.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <vector>

namespace
{

// A stream whose reads fail as told, one errno each (0 leaves errno alone), before it gives its
// text and then ends.
struct SCRIPT {
    std::vector<int> failures;
    std::string text;
    int nRead = 0;
};

ssize_t ScriptRead(void *pCookie, char *pBuf, size_t cbBuf)
{
    auto &script = *static_cast<SCRIPT *>(pCookie);
    const auto nRead = static_cast<size_t>(script.nRead++);
    if (nRead < script.failures.size()) {
        errno = script.failures[nRead] != 0 ? script.failures[nRead] : errno;
        return -1;
    }
    const size_t cb = std::min(cbBuf, script.text.size());
    memcpy(pBuf, script.text.data(), cb);
    script.text.erase(0, cb);
    return static_cast<ssize_t>(cb);
}

FILE *ScriptOpen(SCRIPT &script)
{
    return fopencookie(&script, "r",
                       {.read = ScriptRead, .write = nullptr, .seek = nullptr, .close = nullptr});
}

constexpr int ERRNO_AT_ENTRY = ENOTTY; // no call here fails with it

struct FGETS_CASE {
    std::vector<int> failures;
    const char *szLine; // NULL: nothing is read
    int nRead;
};

const FGETS_CASE FGETS_CASES[] = {
    {{}, "line\n", 1},
    {{EINTR}, "line\n", 2},
    {{EINTR, EINTR}, "line\n", 3},
    {{EINTR, EINTR, EINTR}, nullptr, 3},
    {{EINTR, EINTR, EINTR, EINTR}, nullptr, 3},
    {{EIO}, nullptr, 1},
    {{EAGAIN}, nullptr, 1},
    {{EINTR, EIO}, nullptr, 2},
};

TEST(Fgets, IsTriedThreeTimesWhileInterrupted)
{
    for (const FGETS_CASE &row : FGETS_CASES) {
        SCOPED_TRACE(testing::PrintToString(row.failures));
        SCRIPT script = {.failures = row.failures, .text = "line\nnext\n"};
        FILE *const pStream = ScriptOpen(script);
        ASSERT_NE(pStream, nullptr);
        char szLine[16] = "";
        RecordReset();
        errno = ERRNO_AT_ENTRY;
        char *const pszRead = NLIBCFgets(szLine, 16, pStream);
        const int errnoAtReturn = errno;
        EXPECT_EQ(errnoAtReturn, ERRNO_AT_ENTRY);
        EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
        EXPECT_EQ(script.nRead, row.nRead);
        if (row.szLine == nullptr) {
            EXPECT_EQ(pszRead, nullptr);
        } else {
            EXPECT_EQ(pszRead, szLine);
            EXPECT_STREQ(szLine, row.szLine);
        }
        (void)fclose(pStream);
    }
}

TEST(Fgets, AnErrnoFromBeforeIsNoInterruption)
{
    for (const std::vector<int> &failures : {std::vector<int>{0}, std::vector<int>{EINTR, 0}}) {
        SCRIPT script = {.failures = failures, .text = "line\n"};
        FILE *const pStream = ScriptOpen(script);
        ASSERT_NE(pStream, nullptr);
        char szLine[16];
        errno = EINTR;
        EXPECT_EQ(NLIBCFgets(szLine, 16, pStream), nullptr);
        EXPECT_EQ(errno, EINTR);
        EXPECT_EQ(script.nRead, static_cast<int>(failures.size()));
        (void)fclose(pStream);
    }
}

TEST(Fgets, TheEndOfTheStreamIsFinal)
{
    SCRIPT script = {.failures = {}, .text = ""};
    FILE *const pStream = ScriptOpen(script);
    ASSERT_NE(pStream, nullptr);
    char szLine[16];
    errno = EINTR;
    EXPECT_EQ(NLIBCFgets(szLine, 16, pStream), nullptr);
    EXPECT_EQ(errno, EINTR);
    EXPECT_EQ(script.nRead, 1);
    EXPECT_NE(feof(pStream), 0);
    (void)fclose(pStream);
}

TEST(Fgets, CutsAtTheBuffer)
{
    SCRIPT script = {.failures = {}, .text = "abcdef\n"};
    FILE *const pStream = ScriptOpen(script);
    ASSERT_NE(pStream, nullptr);
    char szLine[8] = "XXXXXXX";
    EXPECT_EQ(NLIBCFgets(szLine, 4, pStream), szLine);
    EXPECT_STREQ(szLine, "abc");
    EXPECT_EQ(szLine[4], 'X');
    EXPECT_EQ(NLIBCFgets(szLine, 8, pStream), szLine);
    EXPECT_STREQ(szLine, "def\n");
    EXPECT_EQ(NLIBCFgets(szLine, 8, pStream), nullptr);
    (void)fclose(pStream);
}

struct PIPE_PAIR {
    int fd[2] = {-1, -1};

    PIPE_PAIR()
    {
        (void)!pipe2(fd, O_CLOEXEC);
    }
    PIPE_PAIR(const PIPE_PAIR &) = delete;
    PIPE_PAIR &operator=(const PIPE_PAIR &) = delete;
    ~PIPE_PAIR()
    {
        (void)close(fd[0]);
        (void)close(fd[1]);
    }
};

// Reads with this errno at entry, and has it back.
ssize_t ReadAt(int errnoAtEntry, int fd, void *p, size_t cb)
{
    errno = errnoAtEntry;
    const ssize_t cbRead = NLIBCRead(fd, p, cb);
    EXPECT_EQ(errno, errnoAtEntry);
    return cbRead;
}

TEST(Read, GivesWhatReadGivesAndErrnoBack)
{
    const PIPE_PAIR pipe;
    char szBuf[8] = "";
    ASSERT_EQ(write(pipe.fd[1], "abc", 3), 3);
    EXPECT_QUIET(ReadAt(ERRNO_AT_ENTRY, pipe.fd[0], szBuf, 2), 2);
    EXPECT_QUIET(ReadAt(ERRNO_AT_ENTRY, pipe.fd[0], szBuf + 2, 6), 1);
    EXPECT_STREQ(szBuf, "abc");

    const TEST_FOLDER folder;
    const int fdEmpty = open(folder.Write("f", "").c_str(), O_RDONLY | O_CLOEXEC);
    EXPECT_QUIET(ReadAt(EINTR, fdEmpty, szBuf, 8), 0);
    (void)close(fdEmpty);
}

TEST(Read, ReportsAFailureWithoutACode)
{
    const PIPE_PAIR pipe;
    char szBuf[8];
    for (const int errnoAtEntry : {ERRNO_AT_ENTRY, EINTR, 0}) {
        EXPECT_QUIET(ReadAt(errnoAtEntry, pipe.fd[1], szBuf, 8), -1); // the end that is written
    }
}

// The pipe that the signal handlers below feed, and after how many signals.
int g_fdFed = -1;
volatile sig_atomic_t g_nSignal = 0;
volatile sig_atomic_t g_nSignalBeforeData = 0;

void FeedPipe(int)
{
    g_nSignal = g_nSignal + 1;
    if (g_nSignal == g_nSignalBeforeData) {
        (void)!write(g_fdFed, "data", 4);
    }
}

ssize_t ReadInterrupted(int nSignalBeforeData, char *pBuf, size_t cbBuf)
{
    const PIPE_PAIR pipe;
    g_fdFed = pipe.fd[1];
    g_nSignal = 0;
    g_nSignalBeforeData = nSignalBeforeData;
    const INTERRUPTION_SCOPE interruption(FeedPipe);
    errno = ERRNO_AT_ENTRY;
    return NLIBCRead(pipe.fd[0], pBuf, cbBuf);
}

TEST(Read, GoesOnAfterTwoInterruptions)
{
    char szBuf[8] = "";
    EXPECT_QUIET(ReadInterrupted(2, szBuf, 8), 4);
    EXPECT_STREQ(szBuf, "data");
    EXPECT_EQ(errno, ERRNO_AT_ENTRY);
}

// The data of the 50th signal is there only so that a fault cannot hang the test.
TEST(Read, GivesUpAtTheThirdInterruption)
{
    char szBuf[8] = "";
    EXPECT_QUIET(ReadInterrupted(50, szBuf, 8), -1);
    EXPECT_GE(g_nSignal, 3);
    EXPECT_EQ(errno, ERRNO_AT_ENTRY);
}

} // namespace
