// SPDX-License-Identifier: MIT
#include "nurostoragecore/partition_version.h"

#include "hwcontrol/disk_name.h"
#include "hwcontrol/disk_port.h"
#include "nurocore/error.h"
#include "nurocore/handle.h"
#include "nurocore/log.h"
#include "nurocore/szlist.h"
#include "nurocore/types.h"
#include "nurostoragecore/partition_layout.h"
#include "nurostoragecore/raid_membership.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <glob.h>

namespace
{

constexpr int LIST_SIZE = 1024;
constexpr int DISK_NAME_SIZE = 64;
constexpr int DISK_PATH_SIZE = 128;
constexpr int RAID_MACHINE = 1;
constexpr int DATA_MD_LAST = 99;
constexpr char SYSTEM_MEMBERS_PATTERN[] = "/sys/block/md0/md/dev-*";

// A member of the system array is always partition 1, so its name without the last character is the
// disk's.
void MemberDiskName(const char *szMember, char *szDisk)
{
    const char *const pchDash = strrchr(szMember, '-'); // the pattern has one
    (void)snprintf(szDisk, DISK_NAME_SIZE, "%s", pchDash + 1);
    const size_t cchDisk = strlen(szDisk);
    szDisk[cchDisk == 0 ? 0 : cchDisk - 1] = '\0';
}

// The first member of the running system array that has a known layout decides. 0 is no layout's
// version, so it means that no member has one.
void VersionOfMembers(const glob_t &members, u32 *pVersion)
{
    for (size_t i = 0; i < members.gl_pathc; i++) {
        char szDisk[DISK_NAME_SIZE];
        MemberDiskName(members.gl_pathv[i], szDisk);
        if (PartitionCheckLayout(szDisk, RAID_MACHINE, pVersion) == 1) {
            return;
        }
    }
    if (*pVersion == 0) {
        *pVersion = PARTITION_LAYOUT_NEWEST;
    }
}

// On a RAID machine a disk counts only if a data array uses it.
bool IsCounted(const char *szDisk)
{
    int nMd = 0;
    return IsSupportRaid() == 0 || (RAIDDiskIsUsedByRAID(szDisk, &nMd) == 1 && nMd <= DATA_MD_LAST);
}

// 0 for a disk that does not count.
u32 VersionOfDisk(const char *szName)
{
    char szDisk[DISK_PATH_SIZE];
    u32 version = 0;
    DevicePathBuild(szName, szDisk, sizeof(szDisk));
    if (PartitionCheckLayout(szDisk, IsSupportRaid(), &version) == 0 || !IsCounted(szDisk)) {
        return 0;
    }
    return version;
}

u32 VersionOfDisks(const NLIBSZLIST *pDisks, int fChooseBiggest)
{
    u32 biggest = 0;
    for (int i = 0; i < pDisks->nItem; i++) {
        const u32 version = VersionOfDisk(NLIBCSzListGet(pDisks, i));
        if (version != 0 && fChooseBiggest == 0) {
            return version;
        }
        biggest = std::max(biggest, version);
    }
    if (biggest != 0) {
        NLIBCLog(LOG_ERR, "Choose biggest partition layout version %d.", static_cast<int>(biggest));
    }
    return biggest;
}

int VersionWithoutArray(u32 *pVersion, int fChooseBiggest)
{
    // Read before the disks are listed: a failed lookup leaves its code in the last-error record,
    // and callers print the code that is there at the end.
    (void)IsSupportRaid();
    PNLIBSZLIST pDisks = NLIBCSzListAlloc(LIST_SIZE);
    const LIST_OWNER owner(&pDisks);
    if (pDisks == nullptr) {
        NLIBCErrSetHere(ERR_OUT_OF_MEMORY);
        return -1;
    }
    if (ExternalDiskPortEnum(ExternalDiskPortOfArrays(), &pDisks) != 0) {
        return -1;
    }
    *pVersion = VersionOfDisks(pDisks, fChooseBiggest);
    if (*pVersion == 0) {
        *pVersion = PARTITION_LAYOUT_NEWEST;
    }
    return 0;
}

} // namespace

int PartitionLayoutGetMax(u32 *pVersion, int fChooseBiggest)
{
    if (pVersion == nullptr) {
        return -1;
    }
    glob_t members = {};
    const GLOB_OWNER owner(&members);
    const int globbed = glob(SYSTEM_MEMBERS_PATTERN, GLOB_NOSORT, nullptr, &members);
    if (globbed != 0 && globbed != GLOB_NOMATCH) {
        return -1;
    }
    if (globbed == 0) {
        VersionOfMembers(members, pVersion);
        return 0;
    }
    return VersionWithoutArray(pVersion, fChooseBiggest);
}

int PartitionLayoutGet(u32 *pVersion)
{
    return PartitionLayoutGetMax(pVersion, 0);
}
