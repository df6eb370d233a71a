// SPDX-License-Identifier: MIT
#include "lock_file.h"

#include "test_child.h"
#include "test_files.h"

#include <gtest/gtest.h>
#include <iterator>

namespace
{

struct ROW {
    const char *szPath;
    u32 lockBit;
};

constexpr ROW ROWS[] = {
    {"/run/nurosdk/lock/lock_nuroinfo", 0x800},
    {"/run/nurosdk/lock/lock_pw", 0x10},
    {"/run/nurosdk/lock/lock_gr", 0x20},
    {"/run/nurosdk/lock/lock_rc", 0x80},
    {"/run/nurosdk/lock/lock_host", 0x100},
    {"/run/nurosdk/lock/lock_smb", 0x40},
    {"/run/nurosdk/lock/lock_exports", 0x200},
    {"/run/nurosdk/lock/lock_nw", 0x400},
    {"/run/nurosdk/lock/lock_apple", 0x1000},
    {"/run/nurosdk/lock/lock_snmp", 0x2000},
    {"/run/nurosdk/lock/lock_win", 0x4000},
    {"/run/nurosdk/lock/lock_tapebkp", 0x8000},
    {"/run/nurosdk/lock/lock_connect", 0x10000},
    {"/run/nurosdk/lock/lock_usbidmap", 0x20000},
    {"/run/nurosdk/lock/lock_duseruid", 0x40000},
    {"/run/nurosdk/lock/lock_dusergid", 0x80000},
    {"/run/nurosdk/lock/lock_fstab", 0x100000},
    {"/run/nurosdk/lock/lock_hotswap", 0x200000},
    {"/run/nurosdk/lock/lock_space", 0x400000},
    {"/run/nurosdk/lock/lock_ttys1", 0x800000},
    {"/run/nurosdk/lock/lock_srvmgr", 0x1000000},
    {"/run/nurosdk/lock/lock_nuromount", 0x2000000},
    {"/run/nurosdk/lock/lock_lunbkptask", 0x4000000},
    {"/run/nurosdk/lock/lock_lunbkp_env", 0x8000000},
    {"/run/nurosdk/lock/lock_pkg", 0x10000000},
    {"/run/nurosdk/lock/lock_ftp_currlog", 0x20000000},
    {"/run/nurosdk/lock/lock_sshd_refernce", 0x40000000},
    {"/run/nurosdk/lock/lock_sftp_currlog", 0x80000000},
};

constexpr size_t ROW_COUNT = std::size(ROWS);
static_assert(ROW_COUNT == 28);

TEST(LockFileTable, HasItsRowsAndAnEnd)
{
    const LOCK_FILE *const pTable = NLIBCLockFileTable();
    for (size_t i = 0; i < ROW_COUNT; i++) {
        EXPECT_STREQ(pTable[i].szPath, ROWS[i].szPath);
        EXPECT_EQ(pTable[i].lockBit, ROWS[i].lockBit) << ROWS[i].szPath;
        EXPECT_EQ(pTable[i].pStream, nullptr);
        EXPECT_EQ(pTable[i].nHold, 0);
        EXPECT_EQ(pTable[i].reserved, 0);
    }
    EXPECT_EQ(pTable[ROW_COUNT].lockBit, 0U);
}

int FailClose(void *)
{
    return -1;
}

// Every row is held.
void HoldAll(const TEST_FOLDER &folder)
{
    LOCK_FILE *const pTable = NLIBCLockFileTable();
    for (size_t i = 0; i < ROW_COUNT; i++) {
        pTable[i].pStream = fopen(folder.Path("lock" + std::to_string(i)).c_str(), "we");
        pTable[i].nHold = static_cast<i32>(i) + 1;
        ASSERT_NE(pTable[i].pStream, nullptr);
    }
}

void ExpectAllReleased()
{
    for (const LOCK_FILE *p = NLIBCLockFileTable(); p->lockBit != 0; p++) {
        EXPECT_EQ(p->pStream, nullptr) << p->szPath;
        EXPECT_EQ(p->nHold, 0) << p->szPath;
    }
}

TEST(LockFilesRelease, ClosesEveryOpenLockFile)
{
    const TEST_FOLDER folder;
    const int nDescriptor = DescriptorCount();
    HoldAll(folder);
    EXPECT_EQ(DescriptorCount(), nDescriptor + static_cast<int>(ROW_COUNT));
    EXPECT_EQ(NLIBCLockFilesRelease(), 0);
    EXPECT_EQ(DescriptorCount(), nDescriptor);
    ExpectAllReleased();
}

TEST(LockFilesRelease, ForgetsAHoldWithoutAStream)
{
    NLIBCLockFileTable()[3].nHold = 7;
    EXPECT_EQ(NLIBCLockFilesRelease(), 0);
    ExpectAllReleased();
}

TEST(LockFilesRelease, GoesOnAfterOneThatDoesNotClose)
{
    LOCK_FILE *const pTable = NLIBCLockFileTable();
    const TEST_FOLDER folder;
    HoldAll(folder);
    (void)fclose(pTable[0].pStream);
    pTable[0].pStream = fopencookie(
        nullptr, "r", {.read = nullptr, .write = nullptr, .seek = nullptr, .close = FailClose});
    ASSERT_NE(pTable[0].pStream, nullptr);
    EXPECT_EQ(NLIBCLockFilesRelease(), -1);
    ExpectAllReleased();
    EXPECT_EQ(NLIBCLockFilesRelease(), 0) << "nothing is closed twice";
}

} // namespace
