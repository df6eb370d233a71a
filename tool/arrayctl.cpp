// SPDX-License-Identifier: MIT
//
// The command line. Output for people goes to standard output, output for developers to syslog, and
// nothing to standard error.
#include "arrayctl_internal.h"

#include "hwcontrol/disk_name.h"
#include "hwcontrol/disk_path.h"
#include "hwcontrol/disk_port.h"
#include "nurocore/conf.h"
#include "nurocore/error.h"
#include "nurocore/handle.h"
#include "nurocore/keyvalue.h"
#include "nurocore/log.h"
#include "nurocore/process.h"
#include "nurocore/szlist.h"
#include "nurocore/text.h"
#include "nurocore/types.h"
#include "nurostoragecore/lvm.h"
#include "nurostoragecore/partition_edit.h"
#include "nurostoragecore/partition_layout.h"
#include "nurostoragecore/partition_version.h"
#include "nurostoragecore/program_path.h"
#include "nurostoragecore/raid_disk.h"
#include "nurostoragecore/raid_info.h"
#include "nurostoragecore/raid_membership.h"
#include "nurostoragecore/raid_remove.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <span>
#include <string_view>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

constexpr int STATUS_OK = 0;
constexpr int STATUS_FAILED = 1;

constexpr size_t MD_PATH_SIZE = 64;
constexpr int DISK_LIST_SIZE = 1024;
constexpr size_t MEMBER_LIST_SIZE = 512;
constexpr size_t CREATE_COMMAND_SIZE = 1024;

constexpr char USAGE[] = "usage:\n"
                         "\tarrayctl destroy <RAID ID> \n"
                         "\tarrayctl status <RAID ID> \n"
                         "\tarrayctl newvol \n"
                         "\tarrayctl initsys \n"
                         "\tarrayctl initsys-dd ";

int Usage()
{
    (void)puts(USAGE);
    return STATUS_FAILED;
}

// --- status ------------------------------------------------------------------------------------

// Kept: every word of the report is limited to a field of 16 bytes, so at most 15 characters are
// printed. The progress of a running rebuild is never shown, and a crashing member's word is cut
// short; scripts compare with the words as they are printed.
constexpr int WORD_FIELD_SIZE = 16;
constexpr int WORD_LENGTH_MAX = WORD_FIELD_SIZE - 1;

struct WORD_ROW {
    u32 value;
    const char *szWord;
};

constexpr WORD_ROW LEVEL_WORDS[] = {
    {RAID_LEVEL_0, "RAID 0"}, {RAID_LEVEL_1, "RAID 1"},   {RAID_LEVEL_5, "RAID 5"},
    {RAID_LEVEL_6, "RAID 6"}, {RAID_LEVEL_10, "RAID_10"}, {RAID_LEVEL_LINEAR, "JBOD"},
};

constexpr WORD_ROW STATUS_WORDS[] = {
    {RAID_STATUS_NORMAL, "NORMAL"},
    {RAID_STATUS_DEGRADE, "DEGRADE"},
    {RAID_STATUS_CRASHED, "CRASHED"},
};

constexpr WORD_ROW REBUILD_WORDS[] = {
    {REBUILD_NONE, "None"},
    {REBUILD_PROGRESSING, "Progressing...["}, // "[done/total]" would follow
    {REBUILD_WAITING, "Waiting..."},
};

constexpr WORD_ROW DISK_WORDS[] = {
    {DISK_STATE_NORMAL, "Normal"},
    {DISK_STATE_FAILED, "Failed"},
    {DISK_STATE_CRASHING, "Failed(Which make RAID Crashed)"},
    {DISK_STATE_REBUILDING, "Rebuilding"},
    {DISK_STATE_SPARE, "Spare Disk"},
    {DISK_STATE_NONE, "None"},
};

// The word of a value, szOther when it has none.
const char *WordOf(std::span<const WORD_ROW> rows, u32 value, const char *szOther)
{
    for (const WORD_ROW &row : rows) {
        if (row.value == value) {
            return row.szWord;
        }
    }
    return szOther;
}

void DisksPrint(const RAID_DISK *pDisks)
{
    const char *szWord = "";
    for (const RAID_DISK *pDisk = pDisks; pDisk != nullptr; pDisk = pDisk->pNext) {
        // Kept: all members share one word field, so an unknown state shows the previous member's
        // word.
        szWord = WordOf(DISK_WORDS, pDisk->state, szWord);
        (void)printf("\t [%s: %.*s]\n", pDisk->szPath, WORD_LENGTH_MAX, szWord);
    }
}

} // namespace

void ReportPrint(const RAID_INFO &info)
{
    const auto cbArray = static_cast<unsigned long long>(info.arraySize);
    // "is running" whatever the status: the array was found.
    (void)printf("%s is running, status: %.*s, rebuilding: %.*s\n", info.szPath, WORD_LENGTH_MAX,
                 WordOf(STATUS_WORDS, info.status, ""), WORD_LENGTH_MAX,
                 WordOf(REBUILD_WORDS, info.rebuild.state, ""));
    (void)printf("Device level: %.*s\n", WORD_LENGTH_MAX, WordOf(LEVEL_WORDS, info.level, ""));
    (void)printf("Device size: %llu MB (%llu bytes) \n", cbArray >> 20U, cbArray);
    (void)puts("Disk: ");
    DisksPrint(info.pDisks);
    (void)putchar('\n');
}

namespace
{

int StatusReport(const char *szMd)
{
    RAID_INFO *pInfo = nullptr;
    if (RAIDInfoGet(szMd, &pInfo) <= 0) {
        (void)printf("RAID %s is not found\n", szMd);
        return STATUS_FAILED;
    }
    ReportPrint(*pInfo);
    RAIDInfoFree(pInfo);
    return STATUS_OK;
}

// --- destroy -----------------------------------------------------------------------------------

// LVM that could not be removed may still hold the array; the pause gives it time to let go.
constexpr unsigned int LVM_FAILED_PAUSE_SECONDS = 3;

// Always returns 0; callers that need to know the outcome look at the array afterwards.
int ArrayDestroy(const char *szMd)
{
    if (LVMRmLVPath(szMd) < 0) {
        // Kept: printed when the removal has failed, not when it has succeeded.
        (void)printf("Found LVM on %s, remove it \n", szMd);
        (void)sleep(LVM_FAILED_PAUSE_SECONDS);
    }
    RAID_INFO *pInfo = nullptr;
    if (RAIDInfoGet(szMd, &pInfo) <= 0) {
        (void)printf("Not found %s \n", szMd);
        return STATUS_OK;
    }
    (void)RAIDRemoveByInfo(pInfo);
    RAIDInfoFree(pInfo);
    return STATUS_OK;
}

// --- shared by the commands that work on all disks ---------------------------------------------

constexpr int PARTITION_SYSTEM = 1;
constexpr int PARTITION_SWAP = 2;

constexpr char FORCE_CLEAN_MARKER[] = "/.force_clean_all_disk";

// The only pair of versions between which an upgrade keeps the data partitions.
constexpr u32 UPGRADE_FROM_VERSION = 7;
constexpr u32 UPGRADE_TO_VERSION = 8;
constexpr u32 ALWAYS_WIPED_VERSION = 1;

constexpr pid_t NO_CHILD = -1;

// A function that forks a child per disk returns the exit status that this process has to end with
// (in a child, and in a parent that cannot fork), else GOES_ON. A child returns through its
// callers, which free its copies of their lists, and ends in main.
constexpr int GOES_ON = -1;

// Logs that there was no memory for a list of disks.
bool IsAllocated(const NLIBSZLIST *pDisks)
{
    if (pDisks == nullptr) {
        NLIBCLog(LOG_ERR, "Out of memeory, failed to allocate memory for PNLIBSZLIST via "
                          "NLIBCSzListAlloc");
        return false;
    }
    return true;
}

bool DisksEnum(PNLIBSZLIST *ppDisks)
{
    const DISK_PORT_TYPE type = ExternalDiskPortOfArrays();
    if (ExternalDiskPortEnum(type, ppDisks) < 0) {
        NLIBCLog(LOG_ERR, "Failed to enum %s",
                 type == EUNIT_DEVICE ? "EUNIT_DEVICE" : "INTERNAL_DEVICE");
        return false;
    }
    return true;
}

// One entry per disk, none of them with a child. NULL when memory runs out.
DISK_CHILD *ChildrenAlloc(int nDisk)
{
    const auto nEntry = static_cast<size_t>(std::max(nDisk, 1));
    const auto pChildren = static_cast<DISK_CHILD *>(calloc(nEntry, sizeof(DISK_CHILD)));
    if (pChildren != nullptr) {
        std::fill_n(pChildren, nEntry, DISK_CHILD{.pid = NO_CHILD, .type = FORMAT_NONE});
    }
    return pChildren;
}

} // namespace

int DiskFormatTypeGet(const char *szDisk, u32 wanted)
{
    constexpr int RAID_MACHINE = 1;
    if (szDisk == nullptr) {
        NLIBCLog(LOG_ERR, "Null List Error");
        return FORMAT_NONE;
    }
    const DEVICE_PATH disk = DevicePathOf(szDisk);
    if (access(FORCE_CLEAN_MARKER, F_OK) == 0) {
        return FORMAT_WIPE;
    }
    bool fSystem = false;
    for (const int partNum : {PARTITION_SYSTEM, PARTITION_SWAP}) {
        u64 start = 0;
        u32 type = 0;
        // Both are queried, whatever the first answer is.
        fSystem =
            PartitionGeometryGet(partNum, disk.sz, &start, &type) != PARTITION_ABSENT || fSystem;
    }
    if (!fSystem) {
        return FORMAT_WIPE;
    }
    u32 version = 0;
    if (PartitionCheckLayout(disk.sz, RAID_MACHINE, &version) != 1) {
        return FORMAT_UNRECOGNISED;
    }
    if (wanted == UPGRADE_TO_VERSION && version == UPGRADE_FROM_VERSION) {
        return FORMAT_KEEP_DATA;
    }
    if (version != wanted) {
        return RAIDDiskIsUsedByRAID(disk.sz, nullptr) == 1 ? FORMAT_NONE : FORMAT_WIPE;
    }
    return wanted == ALWAYS_WIPED_VERSION ? FORMAT_WIPE : FORMAT_KEEP_DATA;
}

namespace
{

int DecideInChild(const char *szDisk, u32 version)
{
    const int type = DiskFormatTypeGet(szDisk, version);
    if (type == FORMAT_NONE) {
        NLIBCLog(LOG_ERR, "Failed to get format type");
    }
    return type;
}

// Forks the child of one disk. Returns false when that fails.
bool ChildStart(DISK_CHILD &child)
{
    child.pid = NLIBCForkCloseIo();
    if (child.pid < 0) {
        NLIBCLog(LOG_ERR, "Failed to fork.");
        return false;
    }
    return true;
}

int DecideStart(const NLIBSZLIST *pDisks, u32 version, DISK_CHILD *pChildren)
{
    for (int i = 0; i < pDisks->nItem; i++) {
        if (!ChildStart(pChildren[i])) {
            return STATUS_FAILED; // children already started are not waited for
        }
        if (pChildren[i].pid == 0) {
            return DecideInChild(NLIBCSzListGet(pDisks, i), version);
        }
    }
    return GOES_ON;
}

constexpr int CHILD_LOST = -1;

// Waits for a disk's child. Returns its exit status, CHILD_LOST when there is none.
int ChildWait(pid_t pid, const char *szDisk)
{
    int status = 0;
    if (waitpid(pid, &status, 0) < 0) {
        NLIBCLog(LOG_ERR, "Wait pid failed. pid: %d disk: %s", pid, szDisk);
        return CHILD_LOST;
    }
    if (!WIFEXITED(status)) {
        NLIBCLog(LOG_ERR, "Child exit not normally, pid: %d disk: %s", pid, szDisk);
        return CHILD_LOST;
    }
    return WEXITSTATUS(status);
}

// Bits 8 to 15 of what system() returned; a shell that could not start counts as failure.
int ShellExitStatus(int result)
{
    return static_cast<int>((static_cast<u32>(result) >> 8U) & 0xFFU);
}

// Partition paths with a blank after each, as many as there is room for.
struct MEMBER_LIST {
    char sz[MEMBER_LIST_SIZE];
    int nPartition; // including those left out
    int nLeftOut;
};

// Appends the path whole or not at all: a truncated one is often the path of a whole disk.
void MemberAppend(const char *szDisk, int partNum, MEMBER_LIST &members)
{
    char szPartition[DEVICE_PATH_SIZE] = "";
    char szEntry[sizeof(szPartition) + 1];
    (void)DiskDevicePartitionPathGet(szDisk, partNum, szPartition, sizeof(szPartition));
    (void)snprintf(szEntry, sizeof(szEntry), "%s ", szPartition);
    members.nPartition++;
    members.nLeftOut += NLIBCStrAppendWhole(members.sz, sizeof(members.sz), szEntry) == 1 ? 0 : 1;
}

// A create command still runs, with fewer partitions than its -n says, and mdadm refuses it.
void LeftOutTell(int nLeftOut, int nPartition)
{
    if (nLeftOut > 0) {
        NLIBCLog(LOG_ERR, "[Info] %d of %d partitions left out, no room in the command", nLeftOut,
                 nPartition);
    }
}

// --- initsys, initsys-dd -----------------------------------------------------------------------

constexpr int CHILD_PARTITIONED = 1;
// Programs that probe new devices may still have the new partitions open; mdadm needs them free.
constexpr unsigned int ARRAY_PAUSE_SECONDS = 3;
constexpr size_t MISSING_TEXT_SIZE = 256;
constexpr size_t DUPLICATE_COMMAND_SIZE = 512;
constexpr char DUPLICATE_COMMAND[] = "/bin/nurodd ";
constexpr char SILENT[] = " > /dev/null 2>&1";

void DecideCollect(const NLIBSZLIST *pDisks, DISK_CHILD *pChildren)
{
    for (int i = 0; i < pDisks->nItem; i++) {
        const int status = ChildWait(pChildren[i].pid, NLIBCSzListGet(pDisks, i));
        pChildren[i].type = status == CHILD_LOST ? FORMAT_NONE : status;
        pChildren[i].pid = NO_CHILD;
    }
}

} // namespace

int PartitionInChild(const char *szDisk, int type, u32 version)
{
    const DEVICE_PATH disk = DevicePathOf(szDisk);
    switch (type) {
    case FORMAT_KEEP_DATA:
    case FORMAT_UNRECOGNISED:
        (void)PartitionClean(disk.sz, PARTITION_CLEAN_SYSTEM);
        break;
    case FORMAT_WIPE:
        (void)PartitionClean(disk.sz, PARTITION_CLEAN_ALL);
        break;
    default:
        return CHILD_STATUS_FAILED;
    }
    if (PartitionCreate(disk.sz, PARTITION_KIND_SYSTEM, &version) < 0) {
        NLIBCLog(LOG_ERR, "Failed to create system partition of %s, newlayout=%d, errno=0x%X",
                 disk.sz, static_cast<int>(version), NLIBCErrGet());
        return CHILD_STATUS_FAILED;
    }
    return CHILD_PARTITIONED;
}

namespace
{

int PartitionStart(const NLIBSZLIST *pDisks, u32 version, std::span<DISK_CHILD> children)
{
    const bool fSomeKeepData = std::any_of(children.begin(), children.end(), [](DISK_CHILD child) {
        return child.type == FORMAT_KEEP_DATA;
    });
    for (int i = 0; i < pDisks->nItem; i++) {
        DISK_CHILD &child = children[static_cast<size_t>(i)];
        if (child.type == FORMAT_NONE || (fSomeKeepData && child.type == FORMAT_UNRECOGNISED)) {
            continue;
        }
        if (!ChildStart(child)) {
            return STATUS_FAILED;
        }
        if (child.pid == 0) {
            return PartitionInChild(NLIBCSzListGet(pDisks, i), child.type, version);
        }
    }
    return GOES_ON;
}

// The disks that were partitioned successfully, as members of the two system arrays.
struct SYSTEM_MEMBERS {
    int nDisk;
    MEMBER_LIST system;
    MEMBER_LIST swap;
};

void SystemDiskTake(const char *szDisk, int nSlot, SYSTEM_MEMBERS &members)
{
    const DEVICE_PATH disk = DevicePathOf(szDisk);
    if (members.nDisk >= nSlot) {
        // There are more disks than slots: this one must not look like a member of an array that
        // it is not in.
        (void)PartitionZeroSuperblock(disk.sz, PARTITION_SYSTEM);
        (void)PartitionZeroSuperblock(disk.sz, PARTITION_SWAP);
        return;
    }
    members.nDisk++;
    MemberAppend(disk.sz, PARTITION_SYSTEM, members.system);
    MemberAppend(disk.sz, PARTITION_SWAP, members.swap);
}

void PartitionCollect(const NLIBSZLIST *pDisks, const DISK_CHILD *pChildren, int nSlot,
                      SYSTEM_MEMBERS &members)
{
    for (int i = 0; i < pDisks->nItem; i++) {
        const char *const szDisk = NLIBCSzListGet(pDisks, i);
        if (pChildren[i].pid != NO_CHILD &&
            ChildWait(pChildren[i].pid, szDisk) == CHILD_PARTITIONED) {
            SystemDiskTake(szDisk, nSlot, members);
        }
    }
}

// Appends the partitions of a list that fit, each with its blank. Returns how many did.
int MembersAppend(const MEMBER_LIST &members, char *szText, size_t cbText)
{
    int nTaken = 0;
    for (const char *szRest = members.sz; *szRest != '\0';) {
        const size_t cchEntry = strcspn(szRest, " ") + 1;
        char szEntry[DEVICE_PATH_SIZE + 1];
        (void)snprintf(szEntry, sizeof(szEntry), "%.*s", static_cast<int>(cchEntry), szRest);
        nTaken += NLIBCStrAppendWhole(szText, cbText, szEntry);
        szRest += cchEntry;
    }
    return nTaken;
}

// A failure of the duplication tool is printed, but does not change the exit status.
void PartitionsDuplicate(const SYSTEM_MEMBERS &members)
{
    char szCommand[DUPLICATE_COMMAND_SIZE] = "";
    constexpr size_t CB_BEFORE_SILENT = sizeof(szCommand) - (sizeof(SILENT) - 1);
    (void)NLIBCStrAppend(szCommand, CB_BEFORE_SILENT, DUPLICATE_COMMAND);
    int nTaken = MembersAppend(members.system, szCommand, CB_BEFORE_SILENT);
    (void)NLIBCStrAppend(szCommand, CB_BEFORE_SILENT, " ");
    nTaken += MembersAppend(members.swap, szCommand, CB_BEFORE_SILENT);
    (void)NLIBCStrAppend(szCommand, sizeof(szCommand), SILENT);
    const int nPartition = members.system.nPartition + members.swap.nPartition;
    LeftOutTell(nPartition - nTaken, nPartition);
    const int result = system(szCommand);
    if (result == -1) {
        (void)puts("can not fork to nurodd");
    } else if (ShellExitStatus(result) != 0) {
        (void)puts("system init with nurodd failed");
    }
}

void MissingTextBuild(int nMissing, char *szText)
{
    szText[0] = '\0';
    for (int i = 0; i < nMissing && strlen(szText) < MISSING_TEXT_SIZE - 1; i++) {
        (void)NLIBCStrAppend(szText, MISSING_TEXT_SIZE, " missing");
    }
}

} // namespace

// The system arrays use the old superblock format.
// Kept: compared over the length of the given path, so any prefix of the two paths matches too.
const char *MetadataOption(const char *szMd)
{
    const size_t cchMd = strlen(szMd);
    const bool fSystemArray =
        strncmp(szMd, "/dev/md0", cchMd) == 0 || strncmp(szMd, "/dev/md1", cchMd) == 0;
    return fSystemArray ? "-e 0.9" : "";
}

int SystemRaidCreate(const char *szMd, int nDisk, int nSlot, const char *szMembers)
{
    if (szMd == nullptr || szMembers == nullptr) {
        return -1;
    }
    char szMissing[MISSING_TEXT_SIZE];
    MissingTextBuild(nSlot - nDisk, szMissing);
    char szCommand[CREATE_COMMAND_SIZE];
    const int cch =
        snprintf(szCommand, sizeof(szCommand),
                 "%s -C %s %s -amd -R -l1 %s -n%d %s %s> /dev/null 2>&1", MDADM_PATH, szMd,
                 MetadataOption(szMd), nDisk == 1 ? "-f" : "", nSlot, szMembers, szMissing);
    (void)sleep(ARRAY_PAUSE_SECONDS);
    if (cch < 0 || ShellExitStatus(system(szCommand)) != 0) {
        NLIBCLog(LOG_ERR, "Failed to create RAID '%s' on '%s' ", szMd, szMembers);
        NLIBCLog(LOG_ERR, "szCmd=[%s]", szCommand);
        return -1;
    }
    return 0;
}

namespace
{

// Creating the arrays is best effort; the exit status depends only on whether there are members.
int SystemArraysCreate(const SYSTEM_MEMBERS &members, int nSlot)
{
    if (members.nDisk == 0) {
        NLIBCLog(LOG_ERR, "No disk to create system and swap partition, initsys fail!");
        return STATUS_FAILED;
    }
    (void)SystemRaidCreate("/dev/md0", members.nDisk, nSlot, members.system.sz);
    (void)SystemRaidCreate("/dev/md1", members.nDisk, nSlot, members.swap.sz);
    NLIBCLog(LOG_ERR, "system inited on [%s], [%s]", members.system.sz, members.swap.sz);
    return STATUS_OK;
}

int SystemInit(bool fDuplicate)
{
    PNLIBSZLIST pDisks = NLIBCSzListAlloc(DISK_LIST_SIZE);
    const LIST_OWNER owner(&pDisks);
    if (!IsAllocated(pDisks)) {
        return STATUS_FAILED;
    }
    const int nSlot = NLIBCConfMaxSysRaidDisksGet();
    u32 version = 0;
    (void)PartitionLayoutGetMax(&version, 1);
    if (version == 0) {
        NLIBCLog(LOG_ERR, "Failed to find partition layout");
        return STATUS_FAILED;
    }
    if (!DisksEnum(&pDisks)) {
        return STATUS_FAILED;
    }
    const HEAP_OWNER<DISK_CHILD> pChildren(ChildrenAlloc(pDisks->nItem));
    if (pChildren == nullptr) {
        NLIBCLog(LOG_ERR, "failed to alloc");
        return STATUS_FAILED;
    }
    int status = DecideStart(pDisks, version, pChildren.get());
    if (status != GOES_ON) {
        return status;
    }
    DecideCollect(pDisks, pChildren.get());
    status = PartitionStart(pDisks, version, {pChildren.get(), static_cast<size_t>(pDisks->nItem)});
    if (status != GOES_ON) {
        return status;
    }
    SYSTEM_MEMBERS members = {};
    PartitionCollect(pDisks, pChildren.get(), nSlot, members);
    LeftOutTell(members.system.nLeftOut, members.system.nPartition);
    LeftOutTell(members.swap.nLeftOut, members.swap.nPartition);
    if (fDuplicate) {
        PartitionsDuplicate(members);
    }
    return SystemArraysCreate(members, nSlot);
}

// --- newvol ------------------------------------------------------------------------------------

constexpr char DATA_MD_PATH[] = "/dev/md2";
constexpr int PARTITION_DATA = 3;
constexpr int NEWVOL_ARGUMENT_COUNT = 2;
constexpr int SPLIT_UNITS_DEFAULT = 12;
constexpr int SPLIT_UNITS_VALUE_SIZE = 16;
constexpr int MIRROR_DISKS_MAX = 2;

struct LEVEL_MARKER {
    const char *szMarker;
    int level;
};

// The first marker that exists decides.
constexpr LEVEL_MARKER LEVEL_MARKERS[] = {
    {"/tmp/raid.0", 0},
    {"/tmp/raid.1", 1},
    {"/tmp/raid.5", 5},
};

// How many disks of an expansion unit one data array may have.
int RaidGroupSplitUnitsGet()
{
    char szValue[SPLIT_UNITS_VALUE_SIZE];
    const int cbFound = NLIBCFileGetKeyValue(NUROINFO_CONF_PATH, "raidgroup_split_units", szValue,
                                             SPLIT_UNITS_VALUE_SIZE, KEYVALUE_FIRST_MATCH);
    return cbFound < 1 ? SPLIT_UNITS_DEFAULT : NLIBCStrToI32(szValue);
}

int NoDisk()
{
    (void)puts("No disk to create RAID... ");
    return STATUS_FAILED;
}

bool DataPartitionRenew(const char *szDisk)
{
    const u32 versionNewest = 0;
    if (PartitionClean(szDisk, PARTITION_CLEAN_DATA) < 0) {
        NLIBCLog(LOG_ERR, "Failed to clean all partition of %s, errno=0x%X", szDisk, NLIBCErrGet());
        return false;
    }
    if (PartitionCreate(szDisk, PARTITION_KIND_DATA, &versionNewest) < 0) {
        NLIBCLog(LOG_ERR, "Failed to create data partition of %s, errno=0x%X", szDisk,
                 NLIBCErrGet());
        return false;
    }
    return true;
}

// Prepares the disks one after the other and stops at the first failure. Returns how many are
// members, -1 on failure.
int DataMembersPrepare(const NLIBSZLIST *pDisks, MEMBER_LIST &members)
{
    int nUsed = 0;
    for (; nUsed < pDisks->nItem; nUsed++) {
        const DEVICE_PATH disk = DevicePathOf(NLIBCSzListGet(pDisks, nUsed));
        if (NLIBCConfSupportDualHead() != 0 && RaidGroupSplitUnitsGet() <= nUsed) {
            NLIBCLog(LOG_ERR, "Get %d disks, more than raid group split unit", nUsed);
            break;
        }
        if (!DataPartitionRenew(disk.sz)) {
            return -1;
        }
        MemberAppend(disk.sz, PARTITION_DATA, members);
    }
    return nUsed;
}

int LevelChoose(int nDisk)
{
    for (const LEVEL_MARKER &row : LEVEL_MARKERS) {
        if (access(row.szMarker, R_OK) == 0) {
            return row.level;
        }
    }
    return nDisk > MIRROR_DISKS_MAX ? 5 : 1;
}

int DataArrayCreate(int nDisk, const MEMBER_LIST &members)
{
    const int level = LevelChoose(nDisk);
    (void)printf("Creating RAID %d volume... \n", level);

    char szCommand[CREATE_COMMAND_SIZE];
    (void)snprintf(szCommand, sizeof(szCommand), "%s -C %s -amd -R -l%d %s -n%d %s> /dev/null 2>&1",
                   MDADM_PATH, DATA_MD_PATH, level, nDisk == 1 ? "-f" : "", nDisk, members.sz);
    const int status = ShellExitStatus(system(szCommand));
    if (status != 0) {
        NLIBCLog(LOG_ERR, "Failed to create RAID '%s' on '%s', errno=%d", DATA_MD_PATH, members.sz,
                 status);
        return STATUS_FAILED;
    }
    return STATUS_OK;
}

int DataVolumeCreate(int argc)
{
    PNLIBSZLIST pDisks = NLIBCSzListAlloc(DISK_LIST_SIZE);
    const LIST_OWNER owner(&pDisks);
    if (argc != NEWVOL_ARGUMENT_COUNT) {
        return Usage();
    }
    if (!IsAllocated(pDisks)) {
        return STATUS_FAILED;
    }
    if (!DisksEnum(&pDisks)) {
        return STATUS_FAILED;
    }
    if (pDisks->nItem == 0) {
        return NoDisk();
    }
    MEMBER_LIST members = {};
    const int nUsed = DataMembersPrepare(pDisks, members);
    if (nUsed < 0) {
        return STATUS_FAILED;
    }
    LeftOutTell(members.nLeftOut, members.nPartition);
    return nUsed == 0 ? NoDisk() : DataArrayCreate(nUsed, members);
}

// --- enumformatalldisks, enumformatalldisks_indualhead_install ---------------------------------

constexpr size_t NUMBERS_TEXT_SIZE = 4096;
constexpr size_t NUMBER_TEXT_SIZE = 16;
constexpr int STATUS_PUSH_FAILED = -1; // the tool's caller sees 255

int PushDecided(PNLIBSZLIST *ppList, const char *szDisk)
{
    if (NLIBCSzListPush(ppList, szDisk) < 0) {
        NLIBCLog(LOG_ERR, "Push %s into FormatAllList failed", DevicePathOf(szDisk).sz);
        return -1;
    }
    return 0;
}

} // namespace

int FormatTypesCollect(const DISK_CHILD *pChildren, FORMAT_LISTS &lists)
{
    for (int i = 0; i < lists.pAll->nItem; i++) {
        const char *const szDisk = NLIBCSzListGet(lists.pAll, i);
        const int type = ChildWait(pChildren[i].pid, szDisk);
        if (type == FORMAT_KEEP_DATA && PushDecided(&lists.pKeepData, szDisk) != 0) {
            return -1;
        }
        if (type == FORMAT_WIPE && PushDecided(&lists.pFormatAll, szDisk) != 0) {
            return -1;
        }
    }
    return 0;
}

namespace
{

void NumbersBuild(const NLIBSZLIST *pDisks, char *szNumbers)
{
    szNumbers[0] = '\0';
    for (int i = 0; i < pDisks->nItem; i++) {
        const DEVICE_PATH disk = DevicePathOf(NLIBCSzListGet(pDisks, i));
        DISK_PATH_INFO info = {};
        if (DiskPathParse(disk.sz, &info) != 0) {
            NLIBCLog(LOG_ERR, "DiskPathParse(%s) fail", disk.sz);
        }
        char szNumber[NUMBER_TEXT_SIZE];
        (void)snprintf(szNumber, sizeof(szNumber), "%d ", info.diskIndex);
        (void)NLIBCStrAppend(szNumbers, NUMBERS_TEXT_SIZE, szNumber);
    }
}

// Prints the numbers and returns how many there are. 1 is also the status of a failure; callers
// distinguish the two by what is printed.
int FormatAllPrint(const FORMAT_LISTS &lists, bool fDualHeadInstall)
{
    // If no disk keeps its data, all are formatted, including the unrecognised ones.
    const NLIBSZLIST *const pChosen = lists.pKeepData->nItem > 0 ? lists.pFormatAll : lists.pAll;
    char szNumbers[NUMBERS_TEXT_SIZE];
    NumbersBuild(pChosen, szNumbers);
    const bool fAll = fDualHeadInstall && NLIBCConfSupportDualHead() != 0 && szNumbers[0] != '\0';
    (void)printf("%s", fAll ? "all" : szNumbers);
    return pChosen->nItem;
}

int FormatAllDisksEnum(bool fDualHeadInstall)
{
    FORMAT_LISTS lists = {};
    const LIST_OWNER allOwner(&lists.pAll);
    const LIST_OWNER keepDataOwner(&lists.pKeepData);
    const LIST_OWNER formatAllOwner(&lists.pFormatAll);
    for (PNLIBSZLIST *const ppList : {&lists.pAll, &lists.pKeepData, &lists.pFormatAll}) {
        *ppList = NLIBCSzListAlloc(DISK_LIST_SIZE);
        if (!IsAllocated(*ppList)) {
            return STATUS_FAILED;
        }
    }
    if (!DisksEnum(&lists.pAll)) {
        return STATUS_FAILED;
    }
    u32 version = 0;
    (void)PartitionLayoutGet(&version);
    if (version == 0) {
        NLIBCLog(LOG_ERR, "Failed to find partition layout");
        return STATUS_FAILED;
    }
    const HEAP_OWNER<DISK_CHILD> pChildren(ChildrenAlloc(lists.pAll->nItem));
    if (pChildren == nullptr) {
        NLIBCLog(LOG_ERR, "Failed to alloc");
        return STATUS_FAILED;
    }
    const int status = DecideStart(lists.pAll, version, pChildren.get());
    if (status != GOES_ON) {
        return status;
    }
    if (FormatTypesCollect(pChildren.get(), lists) != 0) {
        return STATUS_PUSH_FAILED;
    }
    return FormatAllPrint(lists, fDualHeadInstall);
}

// --- dispatch ----------------------------------------------------------------------------------

// How a command takes a RAID ID.
enum class RAID_ID {
    NONE,            // not at all; the command checks further arguments itself
    EXACTLY_ONE,     // any other number of arguments prints the usage
    ONE_AND_IGNORED, // a missing one prints a message and the usage; more are ignored
};

struct COMMAND {
    std::string_view word;
    RAID_ID raidId;
    int (*pRun)(int argc, const char *szMd);
};

int RunDestroy(int /*argc*/, const char *szMd)
{
    return ArrayDestroy(szMd);
}

int RunStatus(int /*argc*/, const char *szMd)
{
    return StatusReport(szMd);
}

int RunNewvol(int argc, const char * /*szMd*/)
{
    return DataVolumeCreate(argc);
}

int RunInitsys(int /*argc*/, const char * /*szMd*/)
{
    return SystemInit(false);
}

int RunInitsysDuplicate(int /*argc*/, const char * /*szMd*/)
{
    return SystemInit(true);
}

int RunEnumFormatAll(int /*argc*/, const char * /*szMd*/)
{
    return FormatAllDisksEnum(false);
}

int RunEnumFormatAllDualHead(int /*argc*/, const char * /*szMd*/)
{
    return FormatAllDisksEnum(true);
}

// The last two are for the installer and not in the usage.
constexpr COMMAND COMMANDS[] = {
    {"destroy", RAID_ID::EXACTLY_ONE, RunDestroy},
    {"status", RAID_ID::ONE_AND_IGNORED, RunStatus},
    {"newvol", RAID_ID::NONE, RunNewvol},
    {"initsys", RAID_ID::NONE, RunInitsys},
    {"initsys-dd", RAID_ID::NONE, RunInitsysDuplicate},
    {"enumformatalldisks", RAID_ID::NONE, RunEnumFormatAll},
    {"enumformatalldisks_indualhead_install", RAID_ID::NONE, RunEnumFormatAllDualHead},
};

constexpr int RAID_ID_ARGUMENT = 2;
constexpr int RAID_ID_ARGUMENT_COUNT = RAID_ID_ARGUMENT + 1;

int CommandRun(const COMMAND &command, int argc, char *argv[])
{
    char szMd[MD_PATH_SIZE] = "";
    if (command.raidId == RAID_ID::EXACTLY_ONE && argc != RAID_ID_ARGUMENT_COUNT) {
        return Usage();
    }
    if (command.raidId == RAID_ID::ONE_AND_IGNORED && argc < RAID_ID_ARGUMENT_COUNT) {
        (void)puts("parameters not enough");
        return Usage();
    }
    if (command.raidId != RAID_ID::NONE) {
        (void)snprintf(szMd, sizeof(szMd), "/dev/md%d", NLIBCStrToI32(argv[RAID_ID_ARGUMENT]));
    }
    return command.pRun(argc, szMd);
}

} // namespace

int main(int argc, char *argv[])
{
    NLIBCStdioOccupy();
    if (argc <= 1) {
        return Usage();
    }
    for (const COMMAND &command : COMMANDS) {
        if (command.word == argv[1]) {
            return CommandRun(command, argc, argv);
        }
    }
    (void)puts("command not recognized");
    return Usage();
}
