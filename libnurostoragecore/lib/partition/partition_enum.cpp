// SPDX-License-Identifier: MIT
#include "nurostoragecore/partition_enum.h"

#include "hwcontrol/disk_name.h"
#include "hwcontrol/disk_path.h"
#include "nurocore/error.h"
#include "nurocore/file.h"
#include "nurocore/log.h"
#include "nurocore/szlist.h"
#include "nurocore/text.h"
#include "nurocore/types.h"

#include <cstring>
#include <string_view>

namespace
{

constexpr int LINE_LIST_SIZE = 1024;
constexpr int FIELD_LIST_SIZE = 128;
constexpr int PATH_SIZE = 64;
constexpr int FIELD_SIZE = 1024; // a line is read in pieces of at most 1023
constexpr int FIELD_COUNT = 4;   // major, minor, blocks, name
constexpr int FIELD_NAME = 3;

bool IsKept(const PARTITION_ENUM_FILTER *pFilter, const char *szName)
{
    if (pFilter == nullptr) {
        return true;
    }
    if (pFilter->szPrefix != nullptr && !std::string_view(szName).starts_with(pFilter->szPrefix)) {
        return false;
    }
    if (pFilter->containerMask == 0) {
        return true;
    }
    u32 container = 0;
    if (DiskContainerGet(szName, &container) != 0) {
        NLIBCLog(LOG_DEBUG, "Failed to parsing device: %s", szName);
        return false;
    }
    return (container & pFilter->containerMask) != 0;
}

// Kept: the heading has four fields too and gives "/dev/name" without a filter; callers skip it.
int LineAppend(const PARTITION_ENUM_FILTER *pFilter, const char *szLine, PNLIBSZLIST *ppFields,
               PNLIBSZLIST *ppList)
{
    NLIBCSzListClear(*ppFields);
    const int nField = NLIBCStrTok(szLine, " \t", ppFields);
    if (nField != FIELD_COUNT) {
        return nField < 0 ? -1 : 0;
    }
    char szName[FIELD_SIZE];
    const char *const szField = NLIBCSzListGet(*ppFields, FIELD_NAME);
    const size_t cchName = strlen(szField) - 1; // its last character is assumed to be the newline
    memcpy(szName, szField, cchName);
    szName[cchName] = '\0';
    if (!IsKept(pFilter, szName)) {
        return 0;
    }
    char szPath[PATH_SIZE];
    DevicePathBuild(szName, szPath, sizeof(szPath));
    return NLIBCSzListPush(ppList, szPath);
}

} // namespace

int PartitionPathEnum(const PARTITION_ENUM_FILTER *pFilter, PNLIBSZLIST *ppList)
{
    if (ppList == nullptr || *ppList == nullptr) {
        NLIBCLog(LOG_ERR, "bad parameters");
        return -1;
    }
    PNLIBSZLIST pLines = NLIBCSzListAlloc(LINE_LIST_SIZE);
    const LIST_OWNER linesOwner(&pLines);
    PNLIBSZLIST pFields = NLIBCSzListAlloc(FIELD_LIST_SIZE);
    const LIST_OWNER fieldsOwner(&pFields);
    if (pLines == nullptr || pFields == nullptr) {
        NLIBCLog(LOG_ERR, "Failed to allocate for partition list, errno=0x%X", NLIBCErrGet());
        return -1;
    }
    NLIBCSzListSort(*ppList, SZLIST_SORTED);
    if (NLIBCFileReadLines("/proc/partitions", &pLines) != 0) {
        NLIBCLog(LOG_ERR, "Failed to read line of /proc/partitions, errno=0x%X", NLIBCErrGet());
        return -1;
    }
    if (pLines->nItem == 0) {
        NLIBCLog(LOG_ERR, "There's no line in /proc/partitions");
        return -1;
    }
    for (int i = 0; i < pLines->nItem; i++) {
        if (LineAppend(pFilter, NLIBCSzListGet(pLines, i), &pFields, ppList) < 0) {
            return -1;
        }
    }
    return (*ppList)->nItem;
}
