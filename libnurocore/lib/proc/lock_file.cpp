// SPDX-License-Identifier: MIT
#include "lock_file.h"

#include <cstdio>

namespace
{

#define LOCK_DIRECTORY "/run/nurosdk/lock/"

LOCK_FILE g_lockFiles[] = {
    {nullptr, LOCK_DIRECTORY "lock_nuroinfo", 0x800, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_pw", 0x10, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_gr", 0x20, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_rc", 0x80, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_host", 0x100, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_smb", 0x40, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_exports", 0x200, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_nw", 0x400, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_apple", 0x1000, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_snmp", 0x2000, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_win", 0x4000, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_tapebkp", 0x8000, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_connect", 0x10000, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_usbidmap", 0x20000, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_duseruid", 0x40000, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_dusergid", 0x80000, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_fstab", 0x100000, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_hotswap", 0x200000, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_space", 0x400000, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_ttys1", 0x800000, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_srvmgr", 0x1000000, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_nuromount", 0x2000000, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_lunbkptask", 0x4000000, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_lunbkp_env", 0x8000000, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_pkg", 0x10000000, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_ftp_currlog", 0x20000000, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_sshd_refernce", 0x40000000, 0, 0},
    {nullptr, LOCK_DIRECTORY "lock_sftp_currlog", 0x80000000, 0, 0},
    {nullptr, nullptr, 0, 0, 0},
};

} // namespace

LOCK_FILE *NLIBCLockFileTable()
{
    return g_lockFiles;
}

int NLIBCLockFilesRelease()
{
    int result = 0;
    for (LOCK_FILE *pLock = g_lockFiles; pLock->lockBit != 0; pLock++) {
        pLock->nHold = 0;
        if (pLock->pStream != nullptr && fclose(pLock->pStream) != 0) {
            result = -1;
        }
        pLock->pStream = nullptr;
    }
    return result;
}
