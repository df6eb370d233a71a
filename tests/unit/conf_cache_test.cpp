// SPDX-License-Identifier: MIT
//
// That the answer to the dual-head question is kept only when its marker was tried: the source is
// compiled in here, with its functions renamed and the machine replaced.
#include "nurocore/conf.h"
#include "nurocore/file.h"
#include "nurocore/keyvalue.h"
#include "nurocore/log.h"
#include "nurocore/text.h"

#include <gtest/gtest.h>
#include <string>
#include <strings.h>
#include <unistd.h>

int ReplacedKeyIsYes(const char *szKey);
int ReplacedMaxDisksGet();
int ReplacedMaxSysRaidDisksGet();
int ReplacedSupportDualHead();

namespace
{

int MarkerTouch(const char *szPath);
int ModelAsk(const char *szPath, const char *szKey, const char *szExpected, int defaultResult);

int NothingAccess(const char *, int)
{
    return -1;
}

} // namespace

#define NLIBCConfKeyIsYes ReplacedKeyIsYes
#define NLIBCConfMaxDisksGet ReplacedMaxDisksGet
#define NLIBCConfMaxSysRaidDisksGet ReplacedMaxSysRaidDisksGet
#define NLIBCConfSupportDualHead ReplacedSupportDualHead
#define NLIBCFileTouch MarkerTouch
#define NLIBCFileCheckKeyValue ModelAsk
#define access NothingAccess
#include "../../libnurocore/lib/conf/conf.cpp"
#undef NLIBCConfKeyIsYes
#undef NLIBCConfMaxDisksGet
#undef NLIBCConfMaxSysRaidDisksGet
#undef NLIBCConfSupportDualHead
#undef NLIBCFileTouch
#undef NLIBCFileCheckKeyValue
#undef access

namespace
{

int g_fModelDualHead = 0;
std::string g_szTouched; // each marker, with what was kept when it was touched

int ModelAsk(const char *, const char *, const char *, int)
{
    return g_fModelDualHead;
}

int MarkerTouch(const char *szPath)
{
    g_szTouched += std::string(szPath) + " " + std::to_string(g_fDualHead) + "\n";
    return 0;
}

TEST(ConfSupportDualHead, IsKeptAfterItsMarkerIsLeft)
{
    EXPECT_EQ(g_fDualHead, -1);
    EXPECT_EQ(ReplacedSupportDualHead(), 0);
    EXPECT_EQ(g_fDualHead, 0);
    EXPECT_EQ(ReplacedSupportDualHead(), 0);

    g_fDualHead = -1;
    g_fModelDualHead = 1;
    EXPECT_EQ(ReplacedSupportDualHead(), 1);
    EXPECT_EQ(g_fDualHead, 1);
    EXPECT_EQ(ReplacedSupportDualHead(), 1);
    EXPECT_EQ(g_szTouched, "/tmp/.not.dualhead -1\n/tmp/.dualhead -1\n");
}

} // namespace
