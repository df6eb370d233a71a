// SPDX-License-Identifier: MIT
//
// Reads that a signal interrupts.
#include "nurocore/io.h"

#include "last_error.h"
#include "sandbox.h"

#include <cerrno>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

namespace
{

struct READ_CASE {
    int error;
    bool fGoOn;
    ssize_t cbRead;
    const char *szTried;
};

constexpr READ_CASE READ_CASES[] = {
    {EINTR, false, 4, "fault read 1\n"},
    {EINTR, true, -1, "fault read 1\nfault read 2\nfault read 3\n"},
    {EIO, true, -1, "fault read 1\n"},
    {EAGAIN, true, -1, "fault read 1\n"},
};

TEST(Read, IsTriedThreeTimesWhileInterrupted)
{
    for (const READ_CASE &row : READ_CASES) {
        SCOPED_TRACE(row.szTried);
        MACHINE machine = MachineMake();
        MachineFile(machine, "/tmp/text", "text");
        machine.faults = {{.szFunction = "read", .error = row.error, .fGoOn = row.fGoOn}};
        const RUN_RESULT result = MachineCall(machine, [&row] {
            const int fd = open("/tmp/text", O_RDONLY);
            ASSERT_GE(fd, 0);
            char szText[8] = "";
            RecordReset();
            errno = ENOTTY;
            EXPECT_EQ(NLIBCRead(fd, szText, sizeof(szText)), row.cbRead);
            EXPECT_EQ(errno, ENOTTY);
            EXPECT_STREQ(szText, row.cbRead < 0 ? "" : "text");
            EXPECT_EQ(NLIBCErrGet(), OLD_CODE);
            (void)close(fd);
        });
        EXPECT_EQ(TranscriptText(result), row.szTried);
    }
}

TEST(Read, TakesTheLowestDescriptorToo)
{
    MACHINE machine = MachineMake();
    MachineFile(machine, "/tmp/text", "text");
    MachineCall(machine, [] {
        char szText[8] = "";
        ASSERT_EQ(close(STDIN_FILENO), 0);
        ASSERT_EQ(open("/tmp/text", O_RDONLY), STDIN_FILENO);
        EXPECT_EQ(NLIBCRead(STDIN_FILENO, szText, sizeof(szText)), 4);
        EXPECT_STREQ(szText, "text");
    });
}

} // namespace
