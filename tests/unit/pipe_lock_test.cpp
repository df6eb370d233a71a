// SPDX-License-Identifier: MIT
//
// How the lock of the registry of streams is waited for. The C library's sched_yield is replaced in
// this program.
#include "pipe_internal.h"

#include <gtest/gtest.h>
#include <sched.h>

namespace
{

int g_nYieldUntilFree = 0;

} // namespace

// The holder lets go while the last one lasts.
extern "C" int sched_yield() noexcept
{
    if (--g_nYieldUntilFree == 0) {
        PipeStreamsUnlock();
    }
    return 0;
}

namespace
{

TEST(StreamsLock, YieldsAfterEach65536Attempts)
{
    EXPECT_EQ(PipeStreamsLock(), 0U);
    for (const auto &[nYield, nFailed] : {std::pair(1, 65536U), {2, 131072U}, {3, 196608U}}) {
        g_nYieldUntilFree = nYield;
        EXPECT_EQ(PipeStreamsLock(), nFailed);
        EXPECT_EQ(g_nYieldUntilFree, 0);
    }
    PipeStreamsUnlock();
    EXPECT_EQ(PipeStreamsLock(), 0U);
    PipeStreamsUnlock();
}

} // namespace
