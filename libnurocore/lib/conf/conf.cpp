// SPDX-License-Identifier: MIT
#include "nurocore/conf.h"

#include "nurocore/file.h"
#include "nurocore/keyvalue.h"
#include "nurocore/log.h"
#include "nurocore/text.h"

#include <strings.h>
#include <unistd.h>

namespace
{

// "yes", its terminator and one byte more: a longer value makes the lookup fail, which means no.
constexpr int YES_VALUE_SIZE = 5;
constexpr int NUMBER_VALUE_SIZE = 64;

constexpr char KEY_MAX_DISKS[] = "maxdisks";
constexpr char KEY_MAX_SYS_RAID_DISKS[] = "max_sys_raid_disks";
constexpr char KEY_SUPPORT_DUAL_HEAD[] = "support_dual_head";
constexpr char MARKER_DUAL_HEAD[] = "/tmp/.dualhead";
constexpr char MARKER_NOT_DUAL_HEAD[] = "/tmp/.not.dualhead";

constexpr int DUAL_HEAD_UNKNOWN = -1;
int g_fDualHead = DUAL_HEAD_UNKNOWN;

bool NumberGet(const char *szKey, int *pNumber)
{
    char szValue[NUMBER_VALUE_SIZE];
    if (NLIBCFileGetKeyValue(NUROINFO_CONF_PATH, szKey, szValue, NUMBER_VALUE_SIZE,
                             KEYVALUE_FIRST_MATCH) < 1) {
        return false;
    }
    *pNumber = NLIBCStrToI32(szValue);
    return true;
}

// Without the marker the next process reads the configuration again and gets the same answer.
void MarkerLeave(const char *szMarker)
{
    if (NLIBCFileTouch(szMarker) != 0) {
        NLIBCLog(LOG_ERR, "Failed to touch '%s'", szMarker);
    }
}

int DualHeadAsk()
{
    if (access(MARKER_DUAL_HEAD, F_OK) == 0) {
        return 1;
    }
    if (access(MARKER_NOT_DUAL_HEAD, F_OK) == 0) {
        return 0;
    }
    const int fDualHead =
        NLIBCFileCheckKeyValue(NUROINFO_CONF_PATH, KEY_SUPPORT_DUAL_HEAD, "yes", 0);
    MarkerLeave(fDualHead == 1 ? MARKER_DUAL_HEAD : MARKER_NOT_DUAL_HEAD);
    return fDualHead;
}

} // namespace

int NLIBCConfKeyIsYes(const char *szKey)
{
    char szValue[YES_VALUE_SIZE];
    if (szKey == nullptr || NLIBCFileGetKeyValue(NUROINFO_CONF_PATH, szKey, szValue, YES_VALUE_SIZE,
                                                 KEYVALUE_FIRST_MATCH) < 1) {
        return 0;
    }
    return strcasecmp(szValue, "yes") == 0 ? 1 : 0;
}

int NLIBCConfMaxDisksGet()
{
    int nDisks = 0;
    if (!NumberGet(KEY_MAX_DISKS, &nDisks)) {
        NLIBCLog(LOG_ERR, "Failed to NLIBCFileGetKeyValue(%s,%s)", NUROINFO_CONF_PATH,
                 KEY_MAX_DISKS);
        return 0;
    }
    return nDisks;
}

int NLIBCConfMaxSysRaidDisksGet()
{
    int nDisks = 0;
    return NumberGet(KEY_MAX_SYS_RAID_DISKS, &nDisks) ? nDisks : NLIBCConfMaxDisksGet();
}

int NLIBCConfSupportDualHead()
{
    if (g_fDualHead == DUAL_HEAD_UNKNOWN) {
        g_fDualHead = DualHeadAsk();
    }
    return g_fDualHead;
}
