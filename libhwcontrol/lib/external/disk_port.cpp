// SPDX-License-Identifier: MIT
#include "hwcontrol/disk_port.h"

#include "hwcontrol/disk_name.h"
#include "nurocore/conf.h"
#include "nurocore/error.h"
#include "nurocore/handle.h"
#include "nurocore/keyvalue.h"
#include "nurocore/log.h"
#include "nurocore/szlist_base.h"
#include "nurocore/text.h"
#include "nurocore/types.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <fnmatch.h>
#include <glob.h>
#include <string_view>

namespace
{

constexpr int MASK_VALUE_SIZE = 65;
constexpr int EUNIT_LIST_SIZE = 1024; // all disks that expansion units report
constexpr int HOST_LIST_SIZE = 256;   // those that one SCSI host reports
constexpr size_t EUNIT_NAME_MAX = 15; // letters of one reported name
constexpr int PATH_SIZE = 512;

constexpr char SCSI_HOST_DIRECTORY[] = "/sys/class/scsi_host/";
constexpr char SCSI_HOST_PATTERN[] = "host*";
constexpr char EUNIT_LIST_KEY[] = "nuro_device_list";

// The masks, in the order they are read. Bit n stands for the disk of index n.
enum MASK { MASK_USB, MASK_ESATA, MASK_INTERNAL, MASK_CACHE, MASK_COUNT };
constexpr const char *MASK_KEYS[MASK_COUNT] = {"usbportcfg", "esataportcfg", "internalportcfg",
                                               "cacheportcfg"};
u64 g_masks[MASK_COUNT] = {};

constexpr int SAS_UNKNOWN = -1;
i32 g_fSupportSas = SAS_UNKNOWN;

bool StartsWith(const char *szText, std::string_view prefix)
{
    return std::string_view(szText).starts_with(prefix);
}

// A missing key leaves the mask as it is.
bool MaskRead(MASK mask)
{
    char szValue[MASK_VALUE_SIZE];
    if (NLIBCFileGetKeyValue(NUROINFO_CONF_PATH, MASK_KEYS[mask], szValue, MASK_VALUE_SIZE,
                             KEYVALUE_FIRST_MATCH) <= 0) {
        return false;
    }
    g_masks[mask] = strtoull(szValue, nullptr, 16);
    return true;
}

// Kept: a machine whose USB mask is 0 or missing reads the file again on every call, and without
// that key nothing is classified at all.
bool MasksLoad()
{
    if (g_masks[MASK_USB] != 0) {
        return true;
    }
    if (!MaskRead(MASK_USB)) {
        NLIBCLog(LOG_ERR, "Get %s key from %s Error", MASK_KEYS[MASK_USB], NUROINFO_CONF_PATH);
        return false;
    }
    (void)MaskRead(MASK_ESATA);
    (void)MaskRead(MASK_INTERNAL);
    (void)MaskRead(MASK_CACHE);
    return true;
}

// 1 shifted left in 32 bits; 0 when the shift is out of range.
u32 PortBit(int shift)
{
    return shift >= 0 && shift < 32 ? 1U << static_cast<u32>(shift) : 0;
}

// Kept: the 32-bit value is sign-extended, so the 32nd disk matches any of bits 31 to 63, and disks
// beyond it match none.
bool IsInMask(MASK mask, int index)
{
    const auto wide = static_cast<u64>(static_cast<i64>(static_cast<i32>(PortBit(index))));
    return (g_masks[mask] & wide) != 0;
}

// Disks of an expansion unit behind an eSATA port have names of two letters; the first letter is
// that of the port.
bool IsOnEsataPort(int index)
{
    const auto ports = static_cast<u32>(g_masks[MASK_ESATA]);
    return g_masks[MASK_ESATA] != 0 && (ports & PortBit(index <= 25 ? index : index / 26 - 1)) != 0;
}

DISK_PORT_TYPE EsataKind(const char *szName)
{
    char szUnits[EUNIT_LIST_SIZE];
    if (ExternalDiskPortEnumEunit(0, szUnits, EUNIT_LIST_SIZE) != 0) {
        return ESATA_DEVICE;
    }
    // Kept: any part of the text matches, so sdg counts as reported when sdga is.
    return strstr(szUnits, szName) != nullptr ? EUNIT_DEVICE : ESATA_DEVICE;
}

struct PORT_PATTERN {
    DISK_PORT_TYPE type;
    const char *szPattern;
};

constexpr char SD_PATTERN[] = "/sys/block/sd*";
constexpr PORT_PATTERN PORT_PATTERNS[] = {
    {INTERNAL_DEVICE, SD_PATTERN},        {ESATA_DEVICE, SD_PATTERN},
    {EUNIT_DEVICE, SD_PATTERN},           {USB_DEVICE, SD_PATTERN},
    {BOOT_DEVICE, "/sys/block/nuroboot"}, {ISD_DEVICE, "/sys/block/isd*"},
    {CACHE_DEVICE, SD_PATTERN},
};

const char *PatternOf(DISK_PORT_TYPE type)
{
    for (const PORT_PATTERN &row : PORT_PATTERNS) {
        if (row.type == type) {
            return row.szPattern;
        }
    }
    return nullptr;
}

int GlobFailed(int reason, const char *szPattern)
{
    if (reason == GLOB_NOMATCH) {
        return 0;
    }
    if (reason == GLOB_ABORTED) {
        NLIBCLog(LOG_ERR, "read error :%s", szPattern);
    } else if (reason == GLOB_NOSPACE) {
        NLIBCLog(LOG_ERR, "out of memory to alloc glob function when looking for:%s", szPattern);
    }
    return -1;
}

int PushMatching(const glob_t &matches, DISK_PORT_TYPE type, PNLIBSZLIST *ppList)
{
    for (size_t i = 0; i < matches.gl_pathc; i++) {
        const char *const pchSlash = strrchr(matches.gl_pathv[i], '/');
        if (pchSlash != nullptr && ExternalDiskPortCheck(pchSlash + 1) == type &&
            NLIBCSzListPush(ppList, pchSlash + 1) < 0) {
            return -1;
        }
    }
    return 0;
}

// The caller's request and buffer, and whether the buffer has a name yet.
struct EUNIT_OUTPUT {
    bool fCheckOpen;
    char *szOut;
    size_t cbOut;
    bool fAny;
};

bool IsOpenable(const char *szName)
{
    const FD_OWNER fd(open(DevicePathOf(szName).sz, O_RDWR | O_CLOEXEC));
    return static_cast<bool>(fd);
}

int NameAppend(const char *szName, EUNIT_OUTPUT &output)
{
    if (output.fCheckOpen && !IsOpenable(szName)) {
        return 0;
    }
    // Kept: this check ignores the blank and the terminator, so the last name may lose its blank,
    // or its last letter as well.
    if (strlen(output.szOut) + strlen(szName) > output.cbOut) {
        NLIBCErrSetHere(ERR_BAD_FORMAT);
        return -1;
    }
    (void)NLIBCStrAppend(output.szOut, output.cbOut, szName);
    (void)NLIBCStrAppend(output.szOut, output.cbOut, " ");
    output.fAny = true;
    return 0;
}

// One host's list is "/dev/" and letters, repeated after each comma; anything else ends it.
int HostListAppend(const char *szList, EUNIT_OUTPUT &output)
{
    const char *pch = szList;
    while (DeviceNameOf(pch) != pch) {
        pch = DeviceNameOf(pch);
        const size_t cchLetters =
            strspn(pch, "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ");
        const size_t cchName = std::min(cchLetters, EUNIT_NAME_MAX);
        char szName[EUNIT_NAME_MAX + 1];
        memcpy(szName, pch, cchName);
        szName[cchName] = '\0';
        if (cchName == 0) {
            break;
        }
        if (NameAppend(szName, output) != 0) {
            return -1;
        }
        pch += cchName;
        if (*pch++ != ',') {
            break;
        }
    }
    return 0;
}

int HostAppend(const char *szHost, EUNIT_OUTPUT &output)
{
    char szPath[PATH_SIZE];
    char szList[HOST_LIST_SIZE];
    if (fnmatch(SCSI_HOST_PATTERN, szHost, 0) != 0) {
        return 0;
    }
    (void)snprintf(szPath, sizeof(szPath), "%s%s/nuro_pm_info", SCSI_HOST_DIRECTORY, szHost);
    if (NLIBCFileGetKeyValue(szPath, EUNIT_LIST_KEY, szList, HOST_LIST_SIZE,
                             KEYVALUE_FIRST_MATCH) <= 0) {
        return 0;
    }
    return HostListAppend(szList, output);
}

// The result of scandir: an array of entries, each allocated separately.
struct DIRECTORY_ENTRIES {
    struct dirent **ppEntries = nullptr;
    int nEntry = 0;

    DIRECTORY_ENTRIES() = default;
    DIRECTORY_ENTRIES(const DIRECTORY_ENTRIES &) = delete;
    DIRECTORY_ENTRIES &operator=(const DIRECTORY_ENTRIES &) = delete;
    ~DIRECTORY_ENTRIES()
    {
        for (int i = 0; i < nEntry; i++) {
            free(ppEntries[i]);
        }
        free(static_cast<void *>(ppEntries));
    }
};

} // namespace

DISK_PORT_TYPE ExternalDiskPortCheck(const char *szPath)
{
    if (szPath == nullptr) {
        NLIBCLog(LOG_ERR, "device path should not be NULL");
        return UNKNOWN_DEVICE;
    }
    if (strstr(szPath, "mmcblk") != nullptr) {
        return MMC_DEVICE;
    }
    char szDisk[DEVICE_PATH_SIZE];
    if (DiskPartitionNumRemove(szPath, szDisk, sizeof(szDisk)) != 0) {
        return UNKNOWN_DEVICE;
    }
    const char *const szName = DeviceNameWithin(szDisk);
    return StartsWith(szName, "nuroboot") ? BOOT_DEVICE : ExternalDiskPortCheckName(szName);
}

DISK_PORT_TYPE ExternalDiskPortCheckName(const char *szName)
{
    if (szName == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return UNKNOWN_DEVICE;
    }
    if (!MasksLoad()) {
        return UNKNOWN_DEVICE;
    }
    if (StartsWith(szName, "isd")) {
        return ISD_DEVICE;
    }
    if (!StartsWith(szName, "sd")) {
        NLIBCLog(LOG_DEBUG, "expected sdx or /dev/sdx, not %s, not match any port type", szName);
        return UNKNOWN_DEVICE;
    }
    const int index = DiskIndexGet(szName);
    if (IsOnEsataPort(index)) {
        return EsataKind(szName);
    }
    if (IsInMask(MASK_INTERNAL, index)) {
        return INTERNAL_DEVICE;
    }
    if (IsInMask(MASK_USB, index)) {
        return USB_DEVICE;
    }
    return IsInMask(MASK_CACHE, index) ? CACHE_DEVICE : OTHER_DEVICE;
}

DISK_PORT_TYPE ExternalDiskPortOfArrays()
{
    return NLIBCConfSupportDualHead() != 0 ? EUNIT_DEVICE : INTERNAL_DEVICE;
}

int ExternalDiskPortEnum(DISK_PORT_TYPE type, PNLIBSZLIST *ppList)
{
    if (ppList == nullptr || *ppList == nullptr) {
        NLIBCLog(LOG_ERR, "device name list can not be NULL");
        return -1;
    }
    const char *const szPattern = PatternOf(type);
    if (szPattern == nullptr) {
        NLIBCLog(LOG_ERR, "disk port type doesn't exist");
        return -1;
    }
    glob_t matches = {};
    const GLOB_OWNER owner(&matches);
    const int globbed = glob(szPattern, GLOB_DOOFFS, nullptr, &matches);
    if (globbed != 0) {
        return GlobFailed(globbed, szPattern);
    }
    if (PushMatching(matches, type, ppList) != 0) {
        return -1;
    }
    NLIBCSzListSort(*ppList, SZLIST_SORTED);
    return 0;
}

int ExternalDiskPortEnumEunit(int fCheckOpen, char *szOut, int cbOut)
{
    if (szOut == nullptr || cbOut <= 0) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    EUNIT_OUTPUT output = {.fCheckOpen = fCheckOpen != 0,
                           .szOut = szOut,
                           .cbOut = static_cast<size_t>(cbOut),
                           .fAny = false};
    memset(szOut, 0, output.cbOut);
    DIRECTORY_ENTRIES hosts;
    hosts.nEntry = scandir(SCSI_HOST_DIRECTORY, &hosts.ppEntries, nullptr, alphasort);
    for (int i = 0; i < hosts.nEntry; i++) {
        if (HostAppend(hosts.ppEntries[i]->d_name, output) != 0) {
            return -1;
        }
    }
    return output.fAny ? 0 : -1;
}

int IsSupportSas()
{
    if (g_fSupportSas == SAS_UNKNOWN) {
        g_fSupportSas = NLIBCConfKeyIsYes("supportsas");
    }
    return g_fSupportSas;
}
