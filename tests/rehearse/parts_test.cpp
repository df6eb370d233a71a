// SPDX-License-Identifier: MIT
//
// What is a question, what a report says, and how things are written down.
#include "bar.h"
#include "inventory.h"
#include "journal.h"
#include "recorder.h"
#include "text.h"

#include <gtest/gtest.h>

namespace
{

struct QUESTION_ROW {
    const char *szName;
    WORDS argv;
    bool fQuestion;
};

const QUESTION_ROW QUESTION_ROWS[] = {
    {"examine", {"/sbin/mdadm", "-E", "/dev/sda1"}, true},
    {"examine several", {"/sbin/mdadm", "-E", "/dev/sda1", "/dev/sdb1"}, true},
    {"examine by another path", {"mdadm", "-E", "/dev/sda1"}, true},
    {"examine nothing", {"/sbin/mdadm", "-E"}, false},
    {"examine with an option", {"/sbin/mdadm", "-E", "--scan"}, false},
    {"examine with an option behind",
     {"/sbin/mdadm", "-E", "/dev/sda1", "--zero-superblock"},
     false},
    {"examine the empty word", {"/sbin/mdadm", "-E", ""}, false},
    {"examine is not first", {"/sbin/mdadm", "/dev/sda1", "-E"}, false},
    {"the long form is not known", {"/sbin/mdadm", "--examine", "/dev/sda1"}, false},
    {"stop", {"/sbin/mdadm", "-S", "/dev/md2"}, false},
    {"zero", {"/sbin/mdadm", "--zero-superblock", "/dev/sda3"}, false},
    {"create", {"/sbin/mdadm", "-C", "/dev/md2", "-amd", "-R"}, false},
    {"list", {"/sbin/sfdisk", "-l", "-uS", "-N3", "/dev/sda"}, true},
    {"list all", {"/sbin/sfdisk", "-l", "/dev/sda"}, true},
    {"list nothing", {"/sbin/sfdisk", "-l"}, false},
    {"list without a disk", {"/sbin/sfdisk", "-l", "-uS"}, false},
    {"list with more", {"/sbin/sfdisk", "-l", "-uS", "-f", "/dev/sda"}, false},
    {"list with no number", {"/sbin/sfdisk", "-l", "-N", "/dev/sda"}, false},
    {"list with half a number", {"/sbin/sfdisk", "-l", "-N3x", "/dev/sda"}, false},
    {"list with a second disk", {"/sbin/sfdisk", "-l", "/dev/sda", "/dev/sdb"}, false},
    {"make", {"/sbin/sfdisk", "-N3", "-l", "/dev/sda"}, false},
    {"sign", {"/sbin/sfdisk", "-M1", "/dev/sda"}, false},
    {"delete", {"/sbin/sfdisk", "--fast-delete", "-1", "/dev/sda"}, false},
    {"rows", {"/sbin/pvs", "-o", "pv_name", "--noheading", "--separator", ":"}, true},
    {"all rows", {"/sbin/pvs"}, true},
    {"rows with a configuration", {"/sbin/pvs", "--config", "x"}, false},
    {"rows without their fields", {"/sbin/pvs", "-o"}, false},
    {"rows with an option for fields", {"/sbin/pvs", "-o", "--foo"}, false},
    {"remove a volume", {"/sbin/lvremove", "-f", "/dev/vg/lv"}, false},
    {"a program of the same file", {"/sbin/pvscan"}, false},
    {"no program", {"/bin/sh", "-E", "/dev/sda1"}, false},
    {"nothing", {}, false},
};

TEST(Recorder, KnowsQuestions)
{
    for (const QUESTION_ROW &row : QUESTION_ROWS) {
        SCOPED_TRACE(row.szName);
        EXPECT_EQ(RecorderIsQuestion(row.argv), row.fQuestion);
    }
}

struct QUOTE_ROW {
    const char *szName;
    std::string szWord;
    const char *szShell;
    const char *szJson;
};

const QUOTE_ROW QUOTE_ROWS[] = {
    {"bare", "/dev/sda1", "/dev/sda1", "\"/dev/sda1\""},
    {"options", "--fast-delete", "--fast-delete", "\"--fast-delete\""},
    {"range", "3:128", "3:128", "\"3:128\""},
    {"empty", "", "''", "\"\""},
    {"blank", "a b", "'a b'", "\"a b\""},
    {"quote", "it's", "'it'\\''s'", "\"it's\""},
    {"double quote", "a\"b", "'a\"b'", "\"a\\\"b\""},
    {"backslash", "a\\b", "'a\\b'", "\"a\\\\b\""},
    {"star", "*", "'*'", "\"*\""},
    {"home", "~", "'~'", "\"~\""},
    {"line end", "a\nb", "$'a\\012b'", "\"a\\u000ab\""},
    {"line end and quote", "a\n'", "$'a\\012\\''", "\"a\\u000a'\""},
    {"escape", "\033[1m", "$'\\033[1m'", "\"\\u001b[1m\""},
    {"not ASCII", "\xc3\xa4", "$'\\303\\244'", "\"\\u00c3\\u00a4\""},
};

TEST(Text, Quotes)
{
    for (const QUOTE_ROW &row : QUOTE_ROWS) {
        SCOPED_TRACE(row.szName);
        EXPECT_EQ(ShellQuoted(row.szWord), row.szShell);
        EXPECT_EQ(JsonQuoted(row.szWord), row.szJson);
    }
}

TEST(Text, TellsSizes)
{
    EXPECT_EQ(SizeText(0), "0 bytes");
    EXPECT_EQ(SizeText(1023), "1023 bytes");
    EXPECT_EQ(SizeText(1024), "1.0 KiB");
    EXPECT_EQ(SizeText(2549940224), "2.3 GiB");
    EXPECT_EQ(SizeText(16ULL << 40U), "16.0 TiB");
}

TEST(Text, SplitsAndJoins)
{
    EXPECT_EQ(Split("a::b", ':'), (WORDS{"a", "", "b"}));
    EXPECT_EQ(Split("", ':'), (WORDS{""}));
    EXPECT_EQ(Join({"a", "b"}, ", "), "a, b");
    EXPECT_EQ(Trimmed(" \ta b\n"), "a b");
    EXPECT_EQ(Trimmed(" \n"), "");
    EXPECT_EQ(NumberOf("12x"), 12U);
    EXPECT_EQ(NumberOf("x"), 0U);
}

TEST(Journal, TakesMessagesApart)
{
    const JOURNAL_HEAD sent = {.kind = JOURNAL_QUESTION, .pid = 7, .parent = 5, .status = 256};
    std::string szMessage(reinterpret_cast<const char *>(&sent), sizeof(sent));
    szMessage += std::string("/sbin/pvs\0\0-o\0", 14);
    JOURNAL_HEAD head = {};
    WORDS argv;
    ASSERT_TRUE(JournalParse(szMessage, &head, &argv));
    EXPECT_EQ(head.kind, JOURNAL_QUESTION);
    EXPECT_EQ(head.pid, 7);
    EXPECT_EQ(head.parent, 5);
    EXPECT_EQ(head.status, 256);
    EXPECT_EQ(argv, (WORDS{"/sbin/pvs", "", "-o"}));
}

TEST(Journal, RefusesWhatIsNone)
{
    JOURNAL_HEAD head = {};
    WORDS argv;
    EXPECT_FALSE(JournalParse("", &head, &argv));
    EXPECT_FALSE(JournalParse("short", &head, &argv));
    EXPECT_FALSE(JournalParse(std::string(sizeof(head), 'x') + "no end", &head, &argv));
}

TEST(Superblock, OfVersion1)
{
    const SUPERBLOCK superblock = SuperblockParse("/dev/sda3:\n"
                                                  "          Magic : a92b4efc\n"
                                                  "        Version : 1.2\n"
                                                  "     Array UUID : 5b1f2c3d:4e5f6071:8293a4b5:2\n"
                                                  "           Name : appliance:2  (local to host)\n"
                                                  "     Raid Level : raid5\n"
                                                  "   Raid Devices : 3\n"
                                                  "    Device Role : Active device 0\n");
    EXPECT_TRUE(superblock.fFound);
    EXPECT_EQ(superblock.szUuid, "5b1f2c3d:4e5f6071:8293a4b5:2");
    EXPECT_EQ(superblock.szMd, "md2");
    EXPECT_EQ(superblock.szLevel, "raid5");
    EXPECT_EQ(superblock.nDevices, 3U);
    EXPECT_EQ(superblock.szRole, "Active device 0");
}

TEST(Superblock, OfVersion0)
{
    const SUPERBLOCK superblock =
        SuperblockParse("        Version : 0.90.00\n"
                        "           UUID : 1:2:3:4 (local to host appliance)\n"
                        "     Raid Level : raid1\n"
                        "   Raid Devices : 4\n"
                        "Preferred Minor : 1\n");
    EXPECT_EQ(superblock.szUuid, "1:2:3:4");
    EXPECT_EQ(superblock.szMd, "md1");
    EXPECT_EQ(superblock.szRole, "");
}

TEST(Superblock, OfNameWithoutNumber)
{
    EXPECT_EQ(SuperblockParse("     Array UUID : 1:2:3:4\n           Name : host:data\n").szMd, "");
    EXPECT_FALSE(SuperblockParse("mdadm: No md superblock detected on /dev/sda1.\n").fFound);
}

PARTITION PartitionAt(int number, std::uint64_t start, std::uint64_t nSector)
{
    PARTITION partition;
    partition.number = number;
    partition.start = start;
    partition.device.nSector = nSector;
    return partition;
}

TEST(Bar, KnowsLayouts)
{
    DISK disk;
    disk.partitions = {PartitionAt(1, 2048, 4980480), PartitionAt(2, 4982528, 4194304)};
    EXPECT_EQ(LayoutVersionText(disk), "8");
    disk.partitions = {PartitionAt(1, 256, 4980480), PartitionAt(2, 4980736, 4194304)};
    EXPECT_EQ(LayoutVersionText(disk), "7");
    disk.partitions = {PartitionAt(1, 63, 4980087), PartitionAt(2, 4980150, 4192965)};
    EXPECT_EQ(LayoutVersionText(disk), "6");
    disk.partitions = {PartitionAt(1, 63, 4980087), PartitionAt(2, 4980150, 1044225)};
    EXPECT_EQ(LayoutVersionText(disk), "2");
    disk.partitions = {PartitionAt(1, 63, 4980087)};
    EXPECT_EQ(LayoutVersionText(disk), "");
    disk.partitions = {PartitionAt(1, 2048, 4980480), PartitionAt(3, 4982528, 4194304)};
    EXPECT_EQ(LayoutVersionText(disk), "");
}

TEST(Bar, IsToScale)
{
    DISK disk;
    disk.device.nSector = 600;
    disk.partitions = {PartitionAt(1, 10, 100), PartitionAt(2, 110, 1), PartitionAt(3, 300, 300)};
    EXPECT_EQ(BarOf(disk), " 1111111111"
                           "2"
                           "                  "
                           "333333333333333333333333333333");
}

} // namespace
