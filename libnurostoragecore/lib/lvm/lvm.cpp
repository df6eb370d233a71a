// SPDX-License-Identifier: MIT
#include "nurostoragecore/lvm.h"

#include "nurocore/io.h"
#include "nurocore/log.h"
#include "nurocore/pipe.h"
#include "nurocore/process.h"
#include "nurostoragecore/program_path.h"
#include "nurostoragecore/space.h"

#include <cstdio>
#include <cstring>
#include <memory>
#include <mntent.h>
#include <string_view>
#include <unistd.h>

namespace
{

constexpr int LINE_SIZE = 1024;
constexpr int LV_PATH_SIZE = 256;
constexpr int MOUNT_ENTRY_SIZE = 4096;
// Gives the processes that umount -k killed time to end: until then the mount point is in use.
constexpr unsigned int UNMOUNT_PAUSE_SECONDS = 1;

constexpr char MOUNTS_PATH[] = "/proc/mounts";

struct MOUNT_TABLE_DELETER {
    void operator()(FILE *pMounts) const
    {
        (void)endmntent(pMounts);
    }
};

using MOUNT_TABLE_OWNER = std::unique_ptr<FILE, MOUNT_TABLE_DELETER>;

// The last row that contains the device's path, so that the last of several volumes is used.
// Kept: any part of a row matches, so a row of /dev/md20 counts for /dev/md2 too.
bool LastRowGet(const char *szDevice, char *szRow)
{
    const PIPE_OWNER pRows(NLIBCPopen(PVS_PATH, "r", "-o", "pv_name,vg_name,lv_name,origin",
                                      "--noheading", "--separator", ":", nullptr));
    if (pRows == nullptr) {
        NLIBCLog(LOG_ERR, "Fail to do [/sbin/pvs -o pv_name,vg_name,lv_name,origin --noheading "
                          "--separator :]");
        return false;
    }
    bool fFound = false;
    char szLine[LINE_SIZE];
    while (NLIBCFgets(szLine, LINE_SIZE, pRows.get()) != nullptr) {
        if (strstr(szLine, szDevice) != nullptr) {
            memcpy(szRow, szLine, sizeof(szLine));
            fFound = true;
        }
    }
    return fFound;
}

// Cuts the text at its first ':'; NULL when it has none.
char *CutAtSeparator(char *szText)
{
    char *const pchSeparator = strchr(szText, ':');
    if (pchSeparator == nullptr) {
        return nullptr;
    }
    *pchSeparator = '\0';
    return pchSeparator + 1;
}

// Writes "/dev/<group>/<volume>" of a row "<device>:<group>:<volume>:<origin>".
int RowToLVPath(char *szRow, char *szOut, int cbOut)
{
    char *const szGroup = CutAtSeparator(szRow);
    if (szGroup == nullptr) {
        NLIBCLog(LOG_ERR, "Invalid pvs result [%s]. separator ':' not found", szRow);
        return -1;
    }
    char *const szVolume = CutAtSeparator(szGroup);
    if (szVolume == nullptr) {
        NLIBCLog(LOG_ERR, "pvg=%s", szGroup);
        return -1;
    }
    if (CutAtSeparator(szVolume) == nullptr) {
        NLIBCLog(LOG_ERR, "plv=%s", szVolume);
        return -1;
    }
    const int cch = snprintf(szOut, static_cast<size_t>(cbOut), "/dev/%s/%s", szGroup, szVolume);
    return cch < 0 ? -1 : 0;
}

void RemoveWith(const char *szTool, const char *szTarget)
{
    // The runner has already recorded the reason for a result of -1.
    if (SpaceExecl(szTool, "-f", szTarget, nullptr) > 0) {
        NLIBCLog(LOG_ERR, "Failed to %s -f %s", szTool, szTarget);
    }
}

void MountRemove(const struct mntent &entry)
{
    if (NLIBCExecl(UMOUNT_PATH, "-R", "-A", "-k", entry.mnt_dir, nullptr) > 0) {
        // Kept: the message names other options than those used.
        NLIBCLog(LOG_ERR, "Failed to /bin/umount -f -k %s", entry.mnt_dir);
    }
    (void)sleep(UNMOUNT_PAUSE_SECONDS);
    if (rmdir(entry.mnt_dir) != 0) {
        NLIBCLog(LOG_ERR, "Failed to rmdir(%s)", entry.mnt_dir);
    }
    RemoveWith(LVREMOVE_PATH, entry.mnt_fsname);
}

int MountsRemove(const char *szLVPath)
{
    // Kept: the prefix has an "s" after the volume's path, so the volume itself does not match.
    char szPrefix[LV_PATH_SIZE + 1];
    (void)snprintf(szPrefix, sizeof(szPrefix), "%ss", szLVPath);

    const MOUNT_TABLE_OWNER pMounts(setmntent(MOUNTS_PATH, "r"));
    if (pMounts == nullptr) {
        NLIBCLog(LOG_ERR, "Failed to open %s", MOUNTS_PATH);
        return -1;
    }
    struct mntent entry = {};
    char szEntry[MOUNT_ENTRY_SIZE];
    while (getmntent_r(pMounts.get(), &entry, szEntry, MOUNT_ENTRY_SIZE) != nullptr) {
        if (strcmp(entry.mnt_type, "aufs") != 0 &&
            std::string_view(entry.mnt_fsname).starts_with(szPrefix)) {
            MountRemove(entry);
        }
    }
    return 0;
}

} // namespace

int LVMGetLVPath(const char *szDevice, char *szOut, int cbOut)
{
    if (szDevice == nullptr || szOut == nullptr || cbOut <= 0) {
        return -1;
    }
    char szRow[LINE_SIZE];
    return LastRowGet(szDevice, szRow) ? RowToLVPath(szRow, szOut, cbOut) : -1;
}

int LVMRmLVPath(const char *szDevice)
{
    if (szDevice == nullptr) {
        return -1;
    }
    char szPath[LV_PATH_SIZE];
    if (LVMGetLVPath(szDevice, szPath, LV_PATH_SIZE) != 0) {
        return 0;
    }
    if (MountsRemove(szPath) != 0) {
        return -1;
    }
    RemoveWith(LVREMOVE_PATH, szPath);
    char *const pchSlash = strrchr(szPath, '/');
    if (pchSlash == nullptr) {
        NLIBCLog(LOG_ERR, "szLVPath=[%s]", szPath);
        return -1;
    }
    *pchSlash = '\0';
    RemoveWith(VGREMOVE_PATH, szPath);
    RemoveWith(PVREMOVE_PATH, szDevice);
    return 0;
}
