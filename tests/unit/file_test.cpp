// SPDX-License-Identifier: MIT
#include "nurocore/file.h"

#include "last_error.h"
#include "test_files.h"
#include "test_szlist.h"

#include <sys/stat.h>

namespace
{

TEST(FileTouch, CreatesAnEmptyFile)
{
    const TEST_FOLDER folder;
    const std::string path = folder.Path("marker");
    EXPECT_QUIET(NLIBCFileTouch(path.c_str()), 0);
    EXPECT_TRUE(std::filesystem::is_regular_file(path));
    EXPECT_EQ(std::filesystem::file_size(path), 0U);
}

TEST(FileTouch, LeavesAFileThatIsThere)
{
    const TEST_FOLDER folder;
    const std::string path = folder.Write("marker", "kept");
    EXPECT_QUIET(NLIBCFileTouch(path.c_str()), 0);
    EXPECT_EQ(FileText(path), "kept");
}

TEST(FileTouch, FailsWithoutACodeWhereNoFileCanBe)
{
    const TEST_FOLDER folder;
    EXPECT_QUIET(NLIBCFileTouch(folder.root.c_str()), -1);
    EXPECT_QUIET(NLIBCFileTouch(folder.Path("absent/marker").c_str()), -1);
    EXPECT_QUIET(NLIBCFileTouch(""), -1);
}

TEST(FileExist, IsForRegularFiles)
{
    const TEST_FOLDER folder;
    const std::string path = folder.Write("file", "");
    EXPECT_QUIET(NLIBCFileExist(path.c_str()), 1);
    std::filesystem::create_symlink(path, folder.root / "link");
    EXPECT_QUIET(NLIBCFileExist(folder.Path("link").c_str()), 1);
    std::filesystem::create_symlink("absent", folder.root / "dangling");
    EXPECT_QUIET(NLIBCFileExist(folder.Path("dangling").c_str()), 0);
    ASSERT_EQ(mkfifo(folder.Path("fifo").c_str(), 0600), 0);
    EXPECT_QUIET(NLIBCFileExist(folder.Path("fifo").c_str()), 0);
    EXPECT_QUIET(NLIBCFileExist(folder.root.c_str()), 0);
    EXPECT_QUIET(NLIBCFileExist("/dev/null"), 0);
    EXPECT_QUIET(NLIBCFileExist(folder.Path("absent").c_str()), 0);
    EXPECT_QUIET(NLIBCFileExist(""), 0);
}

TEST(FileReadLines, KeepsTheLineEnds)
{
    const TEST_FOLDER folder;
    TEST_LIST list({"before"}, SZLIST_UNSORTED);
    EXPECT_QUIET(NLIBCFileReadLines(folder.Write("f", "one\n\n two\r\nlast").c_str(), &list.p), 0);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"before", "one\n", "\n", " two\r\n", "last"}));
}

TEST(FileReadLines, OfAnEmptyFileLeavesTheList)
{
    const TEST_FOLDER folder;
    TEST_LIST list({"before"}, SZLIST_UNSORTED);
    EXPECT_QUIET(NLIBCFileReadLines(folder.Write("f", "").c_str(), &list.p), 0);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"before"}));
}

TEST(FileReadLines, SplitsLinesOf1024CharactersAndMore)
{
    const TEST_FOLDER folder;
    const auto Pieces = [&](size_t cch) {
        TEST_LIST list;
        const std::string path = folder.Write("f", std::string(cch, 'x') + "\nnext\n");
        EXPECT_QUIET(NLIBCFileReadLines(path.c_str(), &list.p), 0);
        return ItemsOf(list.p);
    };
    const std::string full(1023, 'x');
    EXPECT_EQ(Pieces(1022), (ITEMS{std::string(1022, 'x') + "\n", "next\n"}));
    EXPECT_EQ(Pieces(1023), (ITEMS{full, "\n", "next\n"}));
    EXPECT_EQ(Pieces(1024), (ITEMS{full, "x\n", "next\n"}));
    EXPECT_EQ(Pieces(2045), (ITEMS{full, std::string(1022, 'x') + "\n", "next\n"}));
    EXPECT_EQ(Pieces(2046), (ITEMS{full, full, "\n", "next\n"}));
}

TEST(FileReadLines, GrowsTheCallersList)
{
    const TEST_FOLDER folder;
    std::string text;
    for (int i = 0; i < 3000; i++) {
        text += "line " + std::to_string(i) + "\n";
    }
    TEST_LIST list(512);
    ASSERT_EQ(NLIBCFileReadLines(folder.Write("f", text).c_str(), &list.p), 0);
    ASSERT_EQ(list.p->nItem, 3000);
    EXPECT_STREQ(NLIBCSzListGet(list.p, 2999), "line 2999\n");
    EXPECT_EQ(Defect(list.p), "");
}

TEST(FileReadLines, PutsLinesInTheOrderOfASortedList)
{
    const TEST_FOLDER folder;
    TEST_LIST list({}, SZLIST_SORTED);
    ASSERT_EQ(NLIBCFileReadLines(folder.Write("f", "b\nc\na\n").c_str(), &list.p), 0);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"a\n", "b\n", "c\n"}));
}

TEST(FileReadLines, FailsWhenReadingStopsBeforeTheEnd)
{
    const TEST_FOLDER folder; // a folder opens, and every read of it fails
    TEST_LIST list({"before"}, SZLIST_UNSORTED);
    EXPECT_EQ(NLIBCFileReadLines(folder.root.c_str(), &list.p), -1);
    EXPECT_EQ(ItemsOf(list.p), (ITEMS{"before"}));
}

TEST(FileReadLines, FailsWithoutAFile)
{
    const TEST_FOLDER folder;
    TEST_LIST list;
    EXPECT_FAILS(NLIBCFileReadLines(folder.Path("absent").c_str(), &list.p), -1, ERR_OPEN_FAILED);
    EXPECT_EQ(list.p->nItem, 0);
}

} // namespace
