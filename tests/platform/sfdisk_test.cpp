// SPDX-License-Identifier: MIT
// The partitioner on image files. What it leaves is read from the raw bytes and with the stock
// tools. Only files of the test's own folder are ever named to it.
#include <array>
#include <cerrno>
#include <climits>
#include <csignal>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <string>
#include <sys/file.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

namespace
{

using std::string;
using u64 = std::uint64_t;
using WORDS = std::vector<string>;

constexpr u64 MEBIBYTE = 1024 * 1024;

struct RESULT {
    int status; // exit status, or -1 after a signal
    string szOut;
    string szErr;
};

struct ENTRY {
    unsigned boot;
    unsigned type;
    u64 start;
    u64 sectors;
};

string FileRead(const string &szPath)
{
    string text(std::filesystem::file_size(szPath), '\0');
    std::ifstream stream(szPath, std::ios::binary);
    stream.read(text.data(), static_cast<std::streamsize>(text.size()));
    EXPECT_EQ(static_cast<size_t>(stream.gcount()), text.size()) << szPath;
    return text;
}

string RangeRead(const string &szPath, u64 offset, size_t cb)
{
    string text(cb, '\0');
    std::ifstream stream(szPath, std::ios::binary);
    stream.seekg(static_cast<std::streamoff>(offset));
    stream.read(text.data(), static_cast<std::streamsize>(cb));
    EXPECT_EQ(static_cast<size_t>(stream.gcount()), cb);
    return text;
}

void RangeWrite(const string &szPath, u64 offset, const string &bytes)
{
    std::fstream stream(szPath, std::ios::binary | std::ios::in | std::ios::out);
    stream.seekp(static_cast<std::streamoff>(offset));
    stream.write(bytes.data(), static_cast<std::streamsize>(bytes.size()));
    stream.flush();
    ASSERT_TRUE(stream.good());
}

unsigned ByteAt(const string &bytes, size_t at)
{
    return static_cast<unsigned char>(bytes.at(at));
}

u64 Little32(const string &bytes, size_t at)
{
    u64 value = 0;
    for (size_t i = 0; i < 4; i++) {
        value |= u64{ByteAt(bytes, at + i)} << (8 * i);
    }
    return value;
}

string Little32Text(u64 value)
{
    string bytes;
    for (int i = 0; i < 4; i++) {
        bytes += static_cast<char>(value >> (8 * i) & 0xff);
    }
    return bytes;
}

string EntryText(unsigned boot, unsigned type, u64 start, u64 sectors)
{
    const char head[] = {static_cast<char>(boot), 0, 0, 0, static_cast<char>(type), 0, 0, 0};
    return string(head, sizeof(head)) + Little32Text(start) + Little32Text(sectors);
}

// Entry 1 to 4, as the four bytes of the table have it.
ENTRY EntryRead(const string &szPath, int number)
{
    const string bytes = RangeRead(szPath, 446 + 16 * static_cast<u64>(number - 1), 16);
    return {ByteAt(bytes, 0), ByteAt(bytes, 4), Little32(bytes, 8), Little32(bytes, 12)};
}

void ExpectEntry(const string &szPath, int number, unsigned type, u64 start, u64 sectors)
{
    const ENTRY entry = EntryRead(szPath, number);
    EXPECT_EQ(entry.type, type) << "partition " << number;
    EXPECT_EQ(entry.start, start) << "partition " << number;
    EXPECT_EQ(entry.sectors, sectors) << "partition " << number;
}

void ExpectNoEntry(const string &szPath, int number)
{
    EXPECT_EQ(RangeRead(szPath, 446 + 16 * static_cast<u64>(number - 1), 16), string(16, '\0'))
        << "partition " << number;
}

struct CHILD_SETUP {
    string szIn;        // file on standard input
    string szOut;       // file on standard output instead of the one that is read back
    bool fNoFileWrites; // every write to a file fails
};

pid_t ChildStart(const WORDS &words, const string &szOut, const string &szErr,
                 const CHILD_SETUP &setup)
{
    std::vector<char *> arguments;
    for (const string &szWord : words) {
        arguments.push_back(const_cast<char *>(szWord.c_str()));
    }
    arguments.push_back(nullptr);
    const string szIn = setup.szIn.empty() ? "/dev/null" : setup.szIn;
    const pid_t pid = fork();
    if (pid != 0) {
        return pid;
    }
    dup2(open(szIn.c_str(), O_RDONLY), STDIN_FILENO);
    dup2(open(szOut.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600), STDOUT_FILENO);
    dup2(open(szErr.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600), STDERR_FILENO);
    if (setup.fNoFileWrites) {
        // Standard error is a file, too: a pipe of one line does not need a reader.
        int pipeErr[2];
        const rlimit none = {0, 0};
        if (pipe(pipeErr) != 0 || dup2(pipeErr[1], STDERR_FILENO) < 0) {
            _exit(126);
        }
        signal(SIGXFSZ, SIG_IGN);
        setrlimit(RLIMIT_FSIZE, &none);
    }
    execv(arguments[0], arguments.data());
    _exit(127);
}

RESULT ToolRun(const string &szFolder, const WORDS &words, const CHILD_SETUP &setup = {})
{
    const string szOut = setup.szOut.empty() ? szFolder + "/out" : setup.szOut;
    const string szErr = szFolder + "/err";
    int status = 0;
    const pid_t pid = ChildStart(words, szOut, szErr, setup);
    EXPECT_GT(pid, 0);
    EXPECT_EQ(waitpid(pid, &status, 0), pid);
    return {WIFEXITED(status) ? WEXITSTATUS(status) : -1,
            setup.szOut.empty() ? FileRead(szOut) : "", FileRead(szErr)};
}

struct SfdiskTest : testing::Test {
    string szFolder;
    string szImage;

    void SetUp() override
    {
        string szTemplate = testing::TempDir() + "partitionerXXXXXX";
        ASSERT_NE(mkdtemp(szTemplate.data()), nullptr);
        szFolder = szTemplate;
        szImage = szFolder + "/disk.img";
        ImageMake(64 * MEBIBYTE);
    }

    void TearDown() override
    {
        std::filesystem::remove_all(szFolder);
    }

    void ImageMake(u64 cb) const
    {
        std::filesystem::remove(szImage);
        std::ofstream(szImage).close();
        ASSERT_EQ(truncate(szImage.c_str(), static_cast<off_t>(cb)), 0) << strerror(errno);
    }

    RESULT Run(WORDS words, const CHILD_SETUP &setup = {}) const
    {
        words.insert(words.begin(), TESTED_SFDISK);
        return ToolRun(szFolder, words, setup);
    }

    void RunWell(const WORDS &words) const
    {
        const RESULT result = Run(words);
        EXPECT_EQ(result.status, 0) << testing::PrintToString(words);
        EXPECT_EQ(result.szErr, "") << testing::PrintToString(words);
        EXPECT_EQ(result.szOut, "") << testing::PrintToString(words);
    }

    // Refused: that one line, nothing else said, not a byte changed.
    void RunBadly(const WORDS &words, const string &szLine) const
    {
        const string before = FileRead(szImage);
        const RESULT result = Run(words);
        EXPECT_EQ(result.status, 1) << testing::PrintToString(words);
        EXPECT_EQ(result.szErr, "sfdisk: " + szLine + "\n") << testing::PrintToString(words);
        EXPECT_EQ(result.szOut, "") << testing::PrintToString(words);
        EXPECT_TRUE(before == FileRead(szImage)) << testing::PrintToString(words);
    }

    void Sign() const
    {
        RunWell({"-M1", szImage});
    }

    WORDS CreateWords(int number, u64 skip, const string &szSize, const string &szType) const
    {
        return {"-N" + std::to_string(number),
                "-uS",
                "-q",
                "-f",
                "-j" + std::to_string(skip),
                "-z" + szSize,
                "-t" + szType,
                "-F",
                szImage};
    }

    void Create(int number, u64 skip, u64 sectors, const string &szType) const
    {
        RunWell(CreateWords(number, skip, std::to_string(sectors), szType));
    }

    string List(int number) const
    {
        const RESULT result = Run({"-l", "-uS", "-N" + std::to_string(number), szImage});
        EXPECT_EQ(result.status, 0);
        EXPECT_EQ(result.szErr, "");
        return result.szOut;
    }

    // A table as another program makes it.
    void StockTable(const string &szScript) const
    {
        std::ofstream(szFolder + "/script") << szScript;
        const RESULT result =
            ToolRun(szFolder, {STOCK_SFDISK, "-q", szImage}, {szFolder + "/script", "", false});
        ASSERT_EQ(result.status, 0) << result.szErr;
    }

    string StockDump() const
    {
        return ToolRun(szFolder, {STOCK_SFDISK, "--dump", szImage}).szOut;
    }

    string StockProbe() const
    {
        return ToolRun(szFolder, {STOCK_BLKID, "-p", "-o", "export", szImage}).szOut;
    }

    // Every signature that a stock tool sees on the image, type by type.
    string StockSignatures() const
    {
        return ToolRun(szFolder, {STOCK_WIPEFS, "--noheadings", "-O", "TYPE", szImage}).szOut;
    }

    void ExpectCleanTable() const
    {
        EXPECT_EQ(StockSignatures(), "dos\n");
        EXPECT_NE(StockProbe().find("PTTYPE=dos\n"), string::npos);
        EXPECT_EQ(RangeRead(szImage, 510, 2), "\x55\xaa");
        for (int number = 1; number <= 4; number++) {
            ExpectNoEntry(szImage, number);
        }
    }
};

// ---- the command line

struct MALFORMED {
    WORDS words; // DISK stands for the image
    string szLine;
};

const std::vector<MALFORMED> MALFORMED_WORDS = {
    {{}, "these options make no command"},
    {{"DISK"}, "these options make no command"},
    {{"-M1"}, "no disk is named"},
    {{"-M1", ""}, "no disk is named"},
    {{"-M1", "a", "b"}, "more than one disk: 'a' and 'b'"},
    {{"-M", "DISK"}, "unknown option '-M'"},
    {{"-M2", "DISK"}, "unknown option '-M2'"},
    {{"-M1", "-M1", "DISK"}, "option '-M1' is given twice"},
    {{"-M1", "-l", "DISK"}, "these options make no command"},
    {{"-x", "DISK"}, "unknown option '-x'"},
    {{"-", "DISK"}, "unknown option '-'"},
    {{"--", "-M1", "DISK"}, "unknown option '--'"},
    {{"-uM", "-l", "-N1", "DISK"}, "unknown option '-uM'"},
    {{"-qq", "-M1", "DISK"}, "unknown option '-qq'"},
    {{"-l", "-N1", "DISK"}, "these options make no command"},
    {{"-l", "-uS", "DISK"}, "these options make no command"},
    {{"-l", "-uS", "-N", "DISK"}, "bad value '' of option '-N'"},
    {{"-l", "-uS", "-N0", "DISK"}, "bad value '0' of option '-N'"},
    {{"-l", "-uS", "-N-1", "DISK"}, "bad value '-1' of option '-N'"},
    {{"-l", "-uS", "-N+1", "DISK"}, "bad value '+1' of option '-N'"},
    {{"-l", "-uS", "-N 1", "DISK"}, "bad value ' 1' of option '-N'"},
    {{"-l", "-uS", "-N1x", "DISK"}, "bad value '1x' of option '-N'"},
    {{"-l", "-uS", "-N4294967297", "DISK"}, "bad value '4294967297' of option '-N'"},
    {{"--fast-delete", "DISK"}, "bad value 'DISK' of option '--fast-delete'"},
    {{"--fast-delete", "", "DISK"}, "bad value '' of option '--fast-delete'"},
    {{"--fast-delete", "3", "DISK"}, "bad value '3' of option '--fast-delete'"},
    {{"--fast-delete", "2:1", "DISK"}, "bad value '2:1' of option '--fast-delete'"},
    {{"--fast-delete", "0:2", "DISK"}, "bad value '0:2' of option '--fast-delete'"},
    {{"--fast-delete", "1:2:3", "DISK"}, "bad value '1:2:3' of option '--fast-delete'"},
    {{"--fast-delete", ":2", "DISK"}, "bad value ':2' of option '--fast-delete'"},
    {{"--fast-delete", "1:", "DISK"}, "bad value '1:' of option '--fast-delete'"},
    {{"--fast-delete", "-2", "DISK"}, "bad value '-2' of option '--fast-delete'"},
    {{"--fast-delete"}, "bad value '' of option '--fast-delete'"},
    {{"--fast-delete=-1", "DISK"}, "unknown option '--fast-delete=-1'"},
    {{"-N1", "-uS", "-z1", "-tfd", "DISK"}, "these options make no command"},
    {{"-N1", "-uS", "-j1", "-tfd", "DISK"}, "these options make no command"},
    {{"-N1", "-uS", "-j1", "-z1", "DISK"}, "these options make no command"},
    {{"-N1", "-j1", "-z1", "-tfd", "DISK"}, "these options make no command"},
    {{"-N1", "-l", "-uS", "-j1", "-z1", "-tfd", "DISK"}, "these options make no command"},
    {{"-N1", "-uS", "-j-1", "-z1", "-tfd", "DISK"}, "bad value '-1' of option '-j'"},
    {{"-N1", "-uS", "-j18446744073709551616", "-z1", "-tfd", "DISK"},
     "bad value '18446744073709551616' of option '-j'"},
    {{"-N1", "-uS", "-j1", "-z0", "-tfd", "DISK"}, "bad value '0' of option '-z'"},
    {{"-N1", "-uS", "-j1", "-z-2", "-tfd", "DISK"}, "bad value '-2' of option '-z'"},
    {{"-N1", "-uS", "-j1", "-z99999999999999999999", "-tfd", "DISK"},
     "bad value '99999999999999999999' of option '-z'"},
    {{"-N1", "-uS", "-j1", "-z18446744073709551615", "-tfd", "DISK"},
     "bad value '18446744073709551615' of option '-z'"},
    {{"-N1", "-uS", "-j1", "-z1", "-t0", "DISK"}, "bad value '0' of option '-t'"},
    {{"-N1", "-uS", "-j1", "-z1", "-t100", "DISK"}, "bad value '100' of option '-t'"},
    {{"-N1", "-uS", "-j1", "-z1", "-t0xfd", "DISK"}, "bad value '0xfd' of option '-t'"},
    {{"-N1", "-uS", "-j1", "-z1", "-tg", "DISK"}, "bad value 'g' of option '-t'"},
    {{"-N1", "-uS", "-j1", "-z1", "-t5", "DISK"}, "bad value '5' of option '-t'"},
    {{"-N1", "-uS", "-j1", "-z1", "-tF", "DISK"}, "bad value 'F' of option '-t'"},
    {{"-N1", "-uS", "-j1", "-z1", "-tee", "DISK"}, "bad value 'ee' of option '-t'"},
};

string DiskFill(string szText, const string &szDisk)
{
    const size_t at = szText.find("DISK");
    return at == string::npos ? szText : szText.replace(at, 4, szDisk);
}

TEST_F(SfdiskTest, MalformedWordsAreRefusedWithOneLine)
{
    ImageMake(MEBIBYTE);
    Sign();
    for (const MALFORMED &row : MALFORMED_WORDS) {
        WORDS words;
        for (const string &szWord : row.words) {
            words.push_back(DiskFill(szWord, szImage));
        }
        RunBadly(words, DiskFill(row.szLine, szImage));
    }
}

TEST_F(SfdiskTest, WhatIsNoDiskIsRefused)
{
    RunBadly({"-M1", szFolder + "/absent"},
             "cannot open " + szFolder + "/absent: No such file or directory");
    RunBadly({"-M1", szFolder}, szFolder + " is no disk");
    RunBadly({"-l", "-uS", "-N1", "/dev/null"}, "/dev/null is no disk");
    RunBadly({"-M1", "/dev/zero"}, "/dev/zero is no disk");
}

TEST_F(SfdiskTest, AFileWithoutASectorIsRefused)
{
    ImageMake(0);
    RunBadly({"-M1", szImage}, "cannot read " + szImage + ": Invalid argument");
}

// ---- -M1

TEST_F(SfdiskTest, SignatureOnABlankDisk)
{
    Sign();
    ExpectCleanTable();
    // The signature and the disk's number, no other byte.
    string bytes = FileRead(szImage);
    bytes.replace(440, 4, 4, '\0');
    bytes.replace(510, 2, 2, '\0');
    EXPECT_TRUE(bytes == string(64 * MEBIBYTE, '\0'));
}

TEST_F(SfdiskTest, SignatureOnTheSmallestDisk)
{
    ImageMake(512);
    Sign();
    EXPECT_EQ(RangeRead(szImage, 510, 2), "\x55\xaa");
    EXPECT_EQ(std::filesystem::file_size(szImage), 512U);
}

TEST_F(SfdiskTest, SignatureKeepsATableByteForByte)
{
    StockTable("label: dos\nlabel-id: 0x12345678\n1: start=63 size=2000 type=fd bootable\n"
               "2: start=2063 size=1000 type=fd\n3: start=8192 size=90000 type=fd\n");
    RangeWrite(szImage, 0, "boot code");
    RangeWrite(szImage, 63 * 512, "the system");
    const string before = FileRead(szImage);
    Sign();
    Sign();
    EXPECT_TRUE(before == FileRead(szImage));
}

TEST_F(SfdiskTest, SignatureKeepsTheSystemPartitionsAfterTheDataPartitionsAreGone)
{
    StockTable("label: dos\n1: start=2048 size=2000 type=fd\n2: start=4048 size=1000 type=fd\n"
               "3: start=8192 size=90000 type=fd\n");
    RunWell({"--fast-delete", "3:128", szImage});
    Sign();
    ExpectEntry(szImage, 1, 0xfd, 2048, 2000);
    ExpectEntry(szImage, 2, 0xfd, 4048, 1000);
    ExpectNoEntry(szImage, 3);
}

TEST_F(SfdiskTest, SignatureKeepsLogicalPartitions)
{
    StockTable("label: dos\n4: start=8192 size=50000 type=5\n5: start=10240 size=2048 type=83\n"
               "6: start=14336 size=2048 type=83\n");
    const string before = FileRead(szImage);
    Sign();
    EXPECT_TRUE(before == FileRead(szImage));
}

TEST_F(SfdiskTest, SignatureKeepsAnEntryThatReachesOverTheEnd)
{
    Sign();
    RangeWrite(szImage, 446, EntryText(0x80, 0x83, 2048, 10'000'000));
    Sign();
    ExpectEntry(szImage, 1, 0x83, 2048, 10'000'000);
    EXPECT_EQ(EntryRead(szImage, 1).boot, 0x80U);
}

TEST_F(SfdiskTest, SignatureDropsEntriesThatCannotBe)
{
    Sign();
    RangeWrite(szImage, 446,
               EntryText(0, 0xfd, 2048, 100) + EntryText(0, 0xfd, 200'000'000, 100) +
                   EntryText(0, 0x00, 4096, 100) + EntryText(0, 0x83, 0, 100));
    Sign();
    ExpectEntry(szImage, 1, 0xfd, 2048, 100);
    for (int number = 2; number <= 4; number++) {
        ExpectNoEntry(szImage, number);
    }
}

TEST_F(SfdiskTest, SignatureReplacesAGpt)
{
    StockTable("label: gpt\n1: size=10M\n2: size=10M\n");
    ASSERT_EQ(RangeRead(szImage, 512, 8), "EFI PART");
    ASSERT_EQ(RangeRead(szImage, 64 * MEBIBYTE - 512, 8), "EFI PART");
    Sign();
    ExpectCleanTable();
    EXPECT_EQ(RangeRead(szImage, 512, 512), string(512, '\0'));
    EXPECT_EQ(RangeRead(szImage, 64 * MEBIBYTE - 512, 512), string(512, '\0'));
}

TEST_F(SfdiskTest, SignatureReplacesADamagedGpt)
{
    const struct {
        u64 offset;
        size_t cb;
    } damages[] = {{512, 512}, {64 * MEBIBYTE - 512, 512}, {0, 512}, {600, 1}};
    for (const auto &damage : damages) {
        ImageMake(64 * MEBIBYTE);
        StockTable("label: gpt\n1: size=10M\n");
        RangeWrite(szImage, damage.offset, string(damage.cb, '\0'));
        Sign();
        ExpectCleanTable();
        EXPECT_EQ(RangeRead(szImage, 512, 512), string(512, '\0')) << damage.offset;
        EXPECT_EQ(RangeRead(szImage, 64 * MEBIBYTE - 512, 512), string(512, '\0')) << damage.offset;
    }
}

TEST_F(SfdiskTest, SignatureReplacesAProtectiveEntryWithoutAGpt)
{
    Sign();
    RangeWrite(szImage, 446, EntryText(0, 0xee, 1, 131'071));
    Sign();
    ExpectCleanTable();
}

TEST_F(SfdiskTest, SignatureWipesOldGptHeadersBesideKeptPartitions)
{
    StockTable("label: dos\n1: start=2048 size=100 type=fd\n");
    RangeWrite(szImage, 512, "EFI PART old header");
    RangeWrite(szImage, 64 * MEBIBYTE - 512, "EFI PART old backup");
    Sign();
    ExpectEntry(szImage, 1, 0xfd, 2048, 100);
    EXPECT_EQ(RangeRead(szImage, 512, 512), string(512, '\0'));
    EXPECT_EQ(RangeRead(szImage, 64 * MEBIBYTE - 512, 512), string(512, '\0'));
}

TEST_F(SfdiskTest, SignatureNeverWipesInsideAKeptPartition)
{
    StockTable("label: dos\n1: start=1 size=100 type=fd\n2: start=4096 size=126976 type=fd\n");
    RangeWrite(szImage, 512, "EFI PART data of partition 1");
    RangeWrite(szImage, 64 * MEBIBYTE - 512, "EFI PART data of partition 2");
    const string before = FileRead(szImage);
    Sign();
    EXPECT_TRUE(before == FileRead(szImage));
}

TEST_F(SfdiskTest, SignatureReplacesOtherLabels)
{
    for (const char *szLabel : {"sun", "sgi"}) {
        ImageMake(64 * MEBIBYTE);
        StockTable("label: " + string(szLabel) + "\n");
        Sign();
        ExpectCleanTable();
    }
}

TEST_F(SfdiskTest, SignatureWipesAFileSystemOfTheWholeDisk)
{
    ASSERT_EQ(ToolRun(szFolder, {STOCK_MKFS, "-q", szImage}).status, 0);
    ASSERT_EQ(StockSignatures(), "ext4\n");
    Sign();
    ExpectCleanTable();
}

TEST_F(SfdiskTest, SignatureWipesAFileSystemBehindAnEmptyTable)
{
    Sign();
    ASSERT_EQ(ToolRun(szFolder, {STOCK_MKFS, "-q", szImage}).status, 0);
    RangeWrite(szImage, 510, "\x55\xaa");
    Sign();
    ExpectCleanTable();
}

// A raid superblock of version 0.90 stands in the last 64 KiB block but one, in byte order of the
// machine that wrote it.
TEST_F(SfdiskTest, SignatureWipesARaidSuperblockAtTheEnd)
{
    constexpr u64 SUPERBLOCK = 64 * MEBIBYTE - 65536;
    RangeWrite(szImage, SUPERBLOCK,
               Little32Text(0xa92b4efc) + Little32Text(0) + Little32Text(90) + "0123456789abcdef" +
                   string(4096 - 28, '\0'));
    ASSERT_EQ(StockSignatures(), "linux_raid_member\n");
    Sign();
    ExpectCleanTable();
    EXPECT_EQ(RangeRead(szImage, SUPERBLOCK, 4), string(4, '\0'));
}

// A boot sector ends with 55 aa like a table, and its code lies where the entries would be.
TEST_F(SfdiskTest, ABootSectorIsNoTable)
{
    RangeWrite(szImage, 0, "\xeb\x52\x90NTFS    ");
    RangeWrite(szImage, 446, string(64, 'c'));
    RangeWrite(szImage, 510, "\x55\xaa");
    EXPECT_EQ(List(1), "");
    RunWell({"--fast-delete", "-1", szImage});
    RunBadly(CreateWords(1, 63, "100", "fd"), szImage + " has no ms-dos partition table");
    Sign();
    ExpectCleanTable();
}

TEST_F(SfdiskTest, EveryTableGetsItsOwnDiskNumber)
{
    Sign();
    const string first = RangeRead(szImage, 440, 4);
    ImageMake(64 * MEBIBYTE);
    Sign();
    EXPECT_NE(first, RangeRead(szImage, 440, 4));
}

// ---- -N

struct LAYOUT {
    u64 start;
    u64 systemSize;
    u64 swapSize;
    u64 dataGap;
    const char *szTypes[3];
};

TEST_F(SfdiskTest, EveryLayoutOfTheApplianceIsMadeToTheSector)
{
    const LAYOUT layouts[] = {
        {63, 273042, 787185, 273042, {"83", "82", "83"}},
        {63, 4980087, 1044225, 257040, {"83", "82", "83"}},
        {63, 530082, 787185, 16002, {"83", "82", "83"}},
        {63, 722862, 594405, 16002, {"83", "82", "83"}},
        {63, 4980087, 4192965, 257040, {"83", "82", "83"}},
        {256, 4980480, 4194304, 262144, {"83", "82", "83"}},
        {2048, 4980480, 4194304, 260352, {"83", "82", "83"}},
        {63, 1574307, 787185, 273105, {"fd", "fd", "fd"}},
        {63, 4980087, 1044225, 257040, {"fd", "fd", "fd"}},
        {63, 4980087, 4192965, 257040, {"fd", "fd", "fd"}},
        {256, 4980480, 4194304, 262144, {"fd", "fd", "fd"}},
        {2048, 4980480, 4194304, 260352, {"fd", "fd", "fd"}},
        {256, 2097152, 5105569, 524288, {"83", "83", "83"}},
    };
    constexpr u64 SECTORS = 6 * 1024 * MEBIBYTE / 512;

    for (const LAYOUT &layout : layouts) {
        ImageMake(SECTORS * 512);
        Sign();
        Create(1, layout.start, layout.systemSize, layout.szTypes[0]);
        Create(2, 0, layout.swapSize, layout.szTypes[1]);
        WORDS data = CreateWords(3, layout.dataGap, "-1", layout.szTypes[2]);
        data.insert(data.begin() + 1, "");
        RunWell(data);

        const u64 swapStart = layout.start + layout.systemSize;
        const u64 dataStart = swapStart + layout.swapSize + layout.dataGap;
        const u64 expected[3][2] = {{layout.start, layout.systemSize},
                                    {swapStart, layout.swapSize},
                                    {dataStart, SECTORS - dataStart}};
        const string szDump = StockDump();
        for (int i = 0; i < 3; i++) {
            const auto type = static_cast<unsigned>(std::stoul(layout.szTypes[i], nullptr, 16));
            ExpectEntry(szImage, i + 1, type, expected[i][0], expected[i][1]);
            char szLine[200];
            snprintf(szLine, sizeof(szLine), "%s%d : start=%12llu, size=%12llu, type=%s\n",
                     szImage.c_str(), i + 1, static_cast<unsigned long long>(expected[i][0]),
                     static_cast<unsigned long long>(expected[i][1]), layout.szTypes[i]);
            EXPECT_NE(szDump.find(szLine), string::npos) << szDump;
        }
        ExpectNoEntry(szImage, 4);
    }
}

TEST_F(SfdiskTest, CreatingLeavesTheContentOfPartitionsAlone)
{
    Sign();
    RangeWrite(szImage, 2048 * 512, "what was there before");
    Create(1, 2048, 100, "fd");
    EXPECT_EQ(RangeRead(szImage, 2048 * 512, 21), "what was there before");
}

TEST_F(SfdiskTest, CreatingKeepsTheOtherEntriesAndTheBootCode)
{
    StockTable("label: dos\nlabel-id: 0x12345678\n1: start=63 size=2000 type=fd bootable\n"
               "4: start=9000 size=100 type=83\n");
    RangeWrite(szImage, 0, "boot code");
    const string before = RangeRead(szImage, 0, 512);
    Create(2, 0, 50, "82");
    string after = RangeRead(szImage, 0, 512);
    after.replace(446 + 16, 16, 16, '\0');
    EXPECT_EQ(before, after);
    ExpectEntry(szImage, 2, 0x82, 2063, 50);
}

TEST_F(SfdiskTest, SystemPartitionsAreRenewedInFrontOfTheData)
{
    ImageMake(6 * 1024 * MEBIBYTE);
    StockTable("label: dos\n1: start=256 size=4980480 type=fd\n2: start=4980736 size=4194304 "
               "type=fd\n3: start=9437184 size=2000000 type=fd\n");
    RunWell({"--fast-delete", "1:2", szImage});
    Sign();
    Create(1, 2048, 4980480, "fd");
    Create(2, 0, 4194304, "fd");
    ExpectEntry(szImage, 1, 0xfd, 2048, 4980480);
    ExpectEntry(szImage, 2, 0xfd, 4982528, 4194304);
    ExpectEntry(szImage, 3, 0xfd, 9437184, 2000000);
}

TEST_F(SfdiskTest, APartitionMayFillEveryGapToTheSector)
{
    Sign();
    Create(1, 1, 1, "83");
    Create(2, 0, 131'069, "83");
    Create(3, 0, 1, "83");
    ExpectEntry(szImage, 1, 0x83, 1, 1);
    ExpectEntry(szImage, 2, 0x83, 2, 131'069);
    ExpectEntry(szImage, 3, 0x83, 131'071, 1);
    RunBadly(CreateWords(4, 0, "-1", "83"),
             "partition 4 does not fit on " + szImage + ": it begins at sector 131072 of 131072");
}

TEST_F(SfdiskTest, WhatDoesNotFitIsRefused)
{
    Sign();
    const string szPrefix = "partition 1 does not fit on " + szImage;
    RunBadly(CreateWords(1, 0, "100", "83"), szPrefix + ": it begins at sector 0 of 131072");
    RunBadly(CreateWords(1, 0, "-1", "83"), szPrefix + ": it begins at sector 0 of 131072");
    RunBadly(CreateWords(1, 63, "131010", "83"), szPrefix + ": it begins at sector 63 of 131072");
    RunBadly(CreateWords(1, 131'072, "1", "83"),
             szPrefix + ": it begins at sector 131072 of 131072");
    RunBadly(CreateWords(1, 131'072, "-1", "83"),
             szPrefix + ": it begins at sector 131072 of 131072");
    RunBadly(CreateWords(1, 63, "18446744073709551614", "83"),
             szPrefix + ": it begins at sector 63 of 131072");
    RunBadly(CreateWords(1, UINT64_MAX, "1", "83"),
             szPrefix + ": it begins at sector 18446744073709551615 of 131072");
    Create(1, 63, 131'009, "83");
    ExpectEntry(szImage, 1, 0x83, 63, 131'009);
}

TEST_F(SfdiskTest, ASkipThatOverflowsIsRefused)
{
    Sign();
    Create(1, 63, 100, "83");
    RunBadly(CreateWords(2, UINT64_MAX, "1", "83"), "partition 2 does not fit on " + szImage);
}

TEST_F(SfdiskTest, WhatHasNoPredecessorIsRefused)
{
    Sign();
    RunBadly(CreateWords(2, 2048, "100", "83"),
             szImage + " has no partition 1 that partition 2 could follow");
    Create(1, 2048, 100, "83");
    RunBadly(CreateWords(3, 0, "-1", "83"),
             szImage + " has no partition 2 that partition 3 could follow");
}

TEST_F(SfdiskTest, WhatOverlapsIsRefused)
{
    StockTable("label: dos\n1: start=2048 size=100 type=83\n3: start=4096 size=100 type=83\n");
    const string szLine = "partition 2 would overlap partition 3 of " + szImage;
    RunBadly(CreateWords(2, 0, "1949", "83"), szLine);
    RunBadly(CreateWords(2, 0, "-1", "83"), szLine);
    RunBadly(CreateWords(2, 1948, "1", "83"), szLine);
    RunBadly(CreateWords(2, 2047, "100", "83"), szLine);
    RunBadly(CreateWords(4, 0, "131072", "83"),
             "partition 4 does not fit on " + szImage + ": it begins at sector 4196 of 131072");
    Create(2, 0, 1948, "83");
    ExpectEntry(szImage, 2, 0x83, 2148, 1948);
}

TEST_F(SfdiskTest, AnOverlapInFrontIsSeen)
{
    StockTable("label: dos\n3: start=2048 size=100 type=83\n");
    RunBadly(CreateWords(1, 63, "1986", "83"),
             "partition 1 would overlap partition 3 of " + szImage);
    Create(1, 63, 1985, "83");
    ExpectEntry(szImage, 1, 0x83, 63, 1985);
}

TEST_F(SfdiskTest, WhatExistsIsNeverReplaced)
{
    Sign();
    Create(1, 63, 1000, "83");
    const string szLine = "partition 1 of " + szImage + " exists already";
    RunBadly(CreateWords(1, 63, "1000", "83"), szLine);
    RunBadly(CreateWords(1, 2048, "1000", "fd"), szLine);
}

TEST_F(SfdiskTest, LogicalPartitionsAreNotMade)
{
    Sign();
    RunBadly(CreateWords(5, 63, "100", "83"), "partition 5 cannot be made, only 1 to 4");
}

TEST_F(SfdiskTest, OnlyAnMsdosTableGetsPartitions)
{
    const string szLine = szImage + " has no ms-dos partition table";
    RunBadly(CreateWords(1, 2048, "100", "83"), szLine);
    StockTable("label: gpt\n1: size=10M\n");
    RunBadly(CreateWords(2, 0, "100", "83"), szLine);
}

// An entry counts in 32 bits: the last sector of 2 TiB, and what is behind it, is left.
TEST_F(SfdiskTest, TheRestOfALargeDiskEndsAtTwoTebibytes)
{
    ImageMake(3 * 1024 * 1024 * MEBIBYTE);
    Sign();
    const string szLine = "sfdisk: partition 1 does not fit on " + szImage +
                          ": it begins at sector 2048 of 4294967295\n";
    EXPECT_EQ(Run(CreateWords(1, 2048, "4294965248", "fd")).szErr, szLine);
    ExpectNoEntry(szImage, 1);
    RunWell(CreateWords(1, 2048, "-1", "fd"));
    ExpectEntry(szImage, 1, 0xfd, 2048, 4294965247);
    EXPECT_EQ(List(1), szImage + "1 2048 4294967294 4294965247 fd\n");
    RunWell({"--fast-delete", "-1", szImage});
    Create(1, 2048, 4294965247, "fd");
    ExpectEntry(szImage, 1, 0xfd, 2048, 4294965247);
    EXPECT_EQ(Run(CreateWords(2, 0, "-1", "fd")).szErr,
              "sfdisk: partition 2 does not fit on " + szImage +
                  ": it begins at sector 4294967295 of 4294967295\n");
}

// ---- -l

TEST_F(SfdiskTest, ListingIsOneLineOrNothing)
{
    EXPECT_EQ(List(1), "");
    Sign();
    EXPECT_EQ(List(1), "");
    Create(1, 2048, 4000, "fd");
    Create(2, 0, 1000, "7");
    EXPECT_EQ(List(1), szImage + "1 2048 6047 4000 fd\n");
    EXPECT_EQ(List(2), szImage + "2 6048 7047 1000 7\n");
    EXPECT_EQ(List(3), "");
    EXPECT_EQ(List(128), "");
    EXPECT_EQ(List(INT_MAX), "");
}

TEST_F(SfdiskTest, ABootablePartitionIsListedLikeTheOthers)
{
    StockTable("label: dos\n1: start=2048 size=4000 type=fd bootable\n");
    EXPECT_EQ(List(1), szImage + "1 2048 6047 4000 fd\n");
}

TEST_F(SfdiskTest, LogicalPartitionsAreListed)
{
    StockTable("label: dos\n4: start=8192 size=50000 type=f\n5: start=10240 size=2048 type=83\n"
               "6: start=14336 size=1024 type=fd\n");
    EXPECT_EQ(List(4), szImage + "4 8192 58191 50000 f\n");
    EXPECT_EQ(List(5), szImage + "5 10240 12287 2048 83\n");
    EXPECT_EQ(List(6), szImage + "6 14336 15359 1024 fd\n");
    EXPECT_EQ(List(7), "");
}

TEST_F(SfdiskTest, PartitionsOfAGptAreListedAsProtected)
{
    StockTable("label: gpt\n1: start=2048 size=4096\n");
    EXPECT_EQ(List(1), szImage + "1 2048 6143 4096 ee\n");
    EXPECT_EQ(List(2), "");
}

TEST_F(SfdiskTest, ListingChangesNothing)
{
    StockTable("label: gpt\n1: start=2048 size=4096\n");
    RangeWrite(szImage, 64 * MEBIBYTE - 512, string(512, '\0'));
    const string before = FileRead(szImage);
    EXPECT_EQ(List(1), szImage + "1 2048 6143 4096 ee\n");
    EXPECT_TRUE(before == FileRead(szImage));
}

TEST_F(SfdiskTest, ALineThatCannotBeWrittenIsAFailure)
{
    Sign();
    Create(1, 2048, 4000, "fd");
    const RESULT result = Run({"-l", "-uS", "-N1", szImage}, {"", "/dev/full", false});
    EXPECT_EQ(result.status, 1);
    EXPECT_EQ(result.szErr, "sfdisk: cannot write the line\n");
}

// ---- --fast-delete

TEST_F(SfdiskTest, RangesAreDeleted)
{
    const struct {
        const char *szRange;
        std::array<bool, 4> kept;
    } rows[] = {
        {"1:2", {false, false, true, true}},  {"3:128", {true, true, false, false}},
        {"-1", {false, false, false, false}}, {"2:2", {true, false, true, true}},
        {"5:128", {true, true, true, true}},  {"1:2147483647", {false, false, false, false}},
    };
    for (const auto &row : rows) {
        ImageMake(64 * MEBIBYTE);
        StockTable("label: dos\n1: start=2048 size=10 type=fd\n2: start=4096 size=10 type=fd\n"
                   "3: start=6144 size=10 type=fd\n4: start=8192 size=10 type=fd\n");
        const string number = RangeRead(szImage, 440, 6);
        RunWell({"--fast-delete", row.szRange, szImage});
        for (int i = 1; i <= 4; i++) {
            if (row.kept[static_cast<size_t>(i - 1)]) {
                ExpectEntry(szImage, i, 0xfd, 2048 * static_cast<u64>(i), 10);
            } else {
                ExpectNoEntry(szImage, i);
            }
        }
        EXPECT_EQ(RangeRead(szImage, 440, 6), number);
        EXPECT_EQ(RangeRead(szImage, 510, 2), "\x55\xaa");
    }
}

TEST_F(SfdiskTest, DeletingWhatIsNotThereSucceeds)
{
    RunWell({"--fast-delete", "-1", szImage});
    EXPECT_TRUE(FileRead(szImage) == string(64 * MEBIBYTE, '\0'));
    Sign();
    const string before = FileRead(szImage);
    RunWell({"--fast-delete", "-1", szImage});
    RunWell({"--fast-delete", "3:128", szImage});
    EXPECT_TRUE(before == FileRead(szImage));
}

TEST_F(SfdiskTest, DeletingALogicalPartitionMovesTheOthersDown)
{
    StockTable("label: dos\n1: start=2048 size=10 type=fd\n4: start=8192 size=50000 type=5\n"
               "5: start=10240 size=100 type=83\n6: start=14336 size=200 type=83\n"
               "7: start=18432 size=300 type=83\n");
    RunWell({"--fast-delete", "6:6", szImage});
    EXPECT_EQ(List(5), szImage + "5 10240 10339 100 83\n");
    EXPECT_EQ(List(6), szImage + "6 18432 18731 300 83\n");
    EXPECT_EQ(List(7), "");
    RunWell({"--fast-delete", "5:128", szImage});
    EXPECT_EQ(List(1), szImage + "1 2048 2057 10 fd\n");
    EXPECT_EQ(List(4), szImage + "4 8192 58191 50000 5\n");
    EXPECT_EQ(List(5), "");
    EXPECT_EQ(StockDump().find(szImage + "5"), string::npos);
}

TEST_F(SfdiskTest, TheDataPartitionsMayBeLogicalOnes)
{
    StockTable("label: dos\n1: start=2048 size=10 type=fd\n2: start=2058 size=10 type=fd\n"
               "3: start=8192 size=50000 type=5\n5: start=10240 size=100 type=83\n"
               "6: start=14336 size=200 type=83\n");
    RunWell({"--fast-delete", "3:128", szImage});
    for (int number = 3; number <= 6; number++) {
        EXPECT_EQ(List(number), "");
    }
    RunWell(CreateWords(3, 1000, "-1", "fd"));
    ExpectEntry(szImage, 3, 0xfd, 3068, 131'072 - 3068);
    EXPECT_EQ(List(5), "");
}

TEST_F(SfdiskTest, NothingIsDeletedFromAForeignTable)
{
    StockTable("label: gpt\n1: size=10M\n");
    RunBadly({"--fast-delete", "-1", szImage}, szImage + " has no ms-dos partition table");
}

// ---- what stands around a command

TEST_F(SfdiskTest, AFailedWriteIsReported)
{
    const string before = FileRead(szImage);
    EXPECT_EQ(Run({"-M1", szImage}, {"", "", true}).status, 1);
    EXPECT_TRUE(before == FileRead(szImage));
    Sign();
    EXPECT_EQ(Run(CreateWords(1, 2048, "100", "fd"), {"", "", true}).status, 1);
    ExpectNoEntry(szImage, 1);
    Create(1, 2048, 100, "fd");
    EXPECT_EQ(Run({"--fast-delete", "-1", szImage}, {"", "", true}).status, 1);
    ExpectEntry(szImage, 1, 0xfd, 2048, 100);
}

TEST_F(SfdiskTest, ALockedDiskIsWaitedFor)
{
    Sign();
    const int fd = open(szImage.c_str(), O_RDONLY | O_CLOEXEC);
    ASSERT_GE(fd, 0);
    ASSERT_EQ(flock(fd, LOCK_SH), 0);
    EXPECT_EQ(List(1), "") << "two readers do not keep each other away";

    WORDS words = CreateWords(1, 2048, "100", "fd");
    words.insert(words.begin(), TESTED_SFDISK);
    const pid_t pid = ChildStart(words, szFolder + "/out", szFolder + "/err", {});
    ASSERT_GT(pid, 0);
    usleep(300'000);
    int status = 0;
    EXPECT_EQ(waitpid(pid, &status, WNOHANG), 0) << "did not wait for the lock";
    ExpectNoEntry(szImage, 1);
    close(fd);
    ASSERT_EQ(waitpid(pid, &status, 0), pid);
    EXPECT_EQ(status, 0);
    ExpectEntry(szImage, 1, 0xfd, 2048, 100);
}

TEST_F(SfdiskTest, ADiskThatStaysLockedIsRefused)
{
    const int fd = open(szImage.c_str(), O_RDONLY | O_CLOEXEC);
    ASSERT_GE(fd, 0);
    ASSERT_EQ(flock(fd, LOCK_EX), 0);
    RunBadly({"-M1", szImage}, szImage + " is locked by another program");
    close(fd);
    Sign();
}

// Eight at once on one disk: the table is never torn.
TEST_F(SfdiskTest, PartitionersOfOneDiskTakeTurns)
{
    Sign();
    WORDS words = CreateWords(1, 2048, "100", "fd");
    words.insert(words.begin(), TESTED_SFDISK);
    std::vector<pid_t> pids;
    for (int i = 0; i < 8; i++) {
        pids.push_back(ChildStart(words, szFolder + "/out" + std::to_string(i),
                                  szFolder + "/err" + std::to_string(i), {}));
    }
    int nMade = 0;
    for (const pid_t pid : pids) {
        int status = 0;
        ASSERT_EQ(waitpid(pid, &status, 0), pid);
        nMade += status == 0;
    }
    EXPECT_EQ(nMade, 1) << "one made the partition, the others found it there";
    ExpectEntry(szImage, 1, 0xfd, 2048, 100);
}

// Killed at any moment, run again from the start: the same table as without the kill.
TEST_F(SfdiskTest, ARunAfterAKillCompletes)
{
    const std::vector<WORDS> steps = {{"--fast-delete", "-1", szImage},
                                      {"-M1", szImage},
                                      CreateWords(1, 2048, "100", "fd"),
                                      CreateWords(2, 0, "200", "fd")};
    for (int i = 0; i < 60; i++) {
        WORDS words = steps[static_cast<size_t>(i) % steps.size()];
        words.insert(words.begin(), TESTED_SFDISK);
        const pid_t pid = ChildStart(words, szFolder + "/out", szFolder + "/err", {});
        ASSERT_GT(pid, 0);
        usleep(static_cast<useconds_t>(100 * i));
        kill(pid, SIGKILL);
        ASSERT_EQ(waitpid(pid, nullptr, 0), pid);
        for (const WORDS &step : steps) {
            RunWell(step);
        }
        ExpectEntry(szImage, 1, 0xfd, 2048, 100);
        ExpectEntry(szImage, 2, 0xfd, 2148, 200);
        ASSERT_FALSE(HasFailure()) << "killed after " << 100 * i << " us";
    }
}

} // namespace
