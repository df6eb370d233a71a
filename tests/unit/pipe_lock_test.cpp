// SPDX-License-Identifier: MIT
//
// How the lock of the registry of streams is waited for: the source is compiled in here, with its
// functions renamed and its attempts counted.
#include "nurocore/error.h"
#include "nurocore/handle.h"
#include "nurocore/log.h"
#include "nurocore/pipe.h"
#include "nurocore/process.h"
#include "nurocore/types.h"

#include <atomic>
#include <cerrno>
#include <cstdarg>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <paths.h>
#include <sched.h>
#include <sys/types.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

namespace
{

constexpr int ATTEMPTS_MAX = 1000000;

int g_nAttempt = 0;

int Yield();
void StreamsUnlock();

// A wait that never yields comes to its end, too.
u32 Attempt(u32 value)
{
    if (++g_nAttempt == ATTEMPTS_MAX) {
        StreamsUnlock();
    }
    return value;
}

} // namespace

FILE *CountedPopenV(const char *szPath, const char *szMode, char *const argv[]);
FILE *CountedPopen(const char *szPath, const char *szMode, ...);
int CountedPclose(FILE *pStream);

#define NLIBCPopenV CountedPopenV
#define NLIBCPopen CountedPopen
#define NLIBCPclose CountedPclose
#define exchange(value) exchange(Attempt(value))
#define sched_yield Yield
#include "../../libnurocore/lib/proc/pipe.cpp"
#undef NLIBCPopenV
#undef NLIBCPopen
#undef NLIBCPclose
#undef exchange
#undef sched_yield

namespace
{

constexpr size_t YIELDS = 3;
std::vector<int> g_yields; // the attempts before each

// The holder lets go while the third one lasts.
int Yield()
{
    g_yields.push_back(g_nAttempt);
    if (g_yields.size() == YIELDS) {
        StreamsUnlock();
    }
    return 0;
}

TEST(StreamsLock, YieldsAfterEach65536Attempts)
{
    g_nAttempt = 0;
    StreamsLock();
    EXPECT_EQ(g_nAttempt, 1);
    EXPECT_TRUE(g_yields.empty());

    g_nAttempt = 0;
    StreamsLock();
    EXPECT_EQ(g_yields, std::vector<int>({65536, 131072, 196608}));
    EXPECT_EQ(g_nAttempt, 196609);
    EXPECT_EQ(g_streamsLock.load(), 1U);
    StreamsUnlock();
    EXPECT_EQ(g_streamsLock.load(), 0U);
}

} // namespace
