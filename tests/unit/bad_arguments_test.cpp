// SPDX-License-Identifier: MIT
//
// What the functions say to arguments that they cannot take: the result, the code in the last-error
// record, and nothing that was handed to them has changed.
#include "hwcontrol/disk_name.h"
#include "hwcontrol/disk_path.h"
#include "nurocore/file.h"
#include "nurocore/io.h"
#include "nurocore/keyvalue.h"
#include "nurocore/pipe.h"
#include "nurocore/process.h"
#include "nurocore/text.h"

#include "last_error.h"
#include "table.h"
#include "test_files.h"
#include "test_hash.h"

#include <climits>
#include <functional>

namespace
{

constexpr u32 BAD = ERR_BAD_PARAMETER;
constexpr u32 NO_CODE = OLD_CODE;
constexpr int UNKNOWN_ORDER = 2;

// What the calls are handed.
struct GIVEN {
    TEST_LIST list;
    TEST_LIST empty{512};
    TEST_LIST bytes{{"a"}, SZLIST_SORTED};
    TEST_LIST nocase{{"a"}, SZLIST_CASE_SORTED};
    TEST_LIST unknown{{"a"}, UNKNOWN_ORDER};
    PNLIBSZLIST pNoList = nullptr;
    int flags; // of a merge
    TEST_HASH hash{};
    PNLIBHASH pNoHash = nullptr;
    TEST_FOLDER folder{};
    std::string path = folder.Write("conf", "k=v\n");
    const char *szPath = path.c_str();
    FILE *pStream = fopen(szPath, "re");
    char szText[40] = "XXXXXXX";
    char *psz = szText;
    int cb = 8;
    char *pszNone = nullptr;
    int cbNegative = -1;
    char szName[5] = "true";
    char *argv[2] = {szName, nullptr};
    u32 mask = 0xA5A5A5A5;
    DISK_PATH_INFO info = {99, 99, 99, 99};

    GIVEN(int fMode, int flagsIn) : list({"a"}, fMode), flags(flagsIn)
    {
    }
    GIVEN(const GIVEN &) = delete;
    GIVEN &operator=(const GIVEN &) = delete;
    ~GIVEN()
    {
        (void)fclose(pStream);
    }
};

void ExpectUnchanged(const GIVEN &given)
{
    for (const TEST_LIST *pList : {&given.list, &given.bytes, &given.nocase, &given.unknown}) {
        EXPECT_EQ(ItemsOf(pList->p), (ITEMS{"a"}));
        EXPECT_EQ(Defect(pList->p), "");
    }
    EXPECT_EQ(given.empty.p->nItem, 0);
    EXPECT_EQ(given.pNoList, nullptr);
    EXPECT_EQ(given.hash.p->nEntry, 0);
    EXPECT_EQ(std::string(given.szText, sizeof(given.szText)), "XXXXXXX" + std::string(33, '\0'));
    EXPECT_EQ(given.psz, given.szText);
    EXPECT_EQ(given.cb, 8);
    EXPECT_EQ(ftell(given.pStream), 0);
    EXPECT_EQ(given.mask, 0xA5A5A5A5);
    EXPECT_EQ(given.info.diskIndex, 99);
}

// The call without what a test's name cannot hold.
std::string NameOf(const char *szCall)
{
    std::string name;
    for (const char *pch = szCall; *pch != '\0'; pch++) {
        name += *pch == '-' ? "Minus" : isalnum(*pch) != 0 ? std::string(1, *pch) : "";
    }
    return name;
}

struct BAD_CALL {
    std::string szName;
    std::function<void(GIVEN &)> expect;
    u32 code;
};

// The call's name, and that it returns what stands beside it.
#define CALL(call, result)                                                                         \
    NameOf(#call), [](GIVEN &given) { EXPECT_EQ((void(given), call), result); }

const BAD_CALL BAD_CALLS[] = {
    // lists
    {CALL(NLIBCSzListPush(nullptr, "b"), -1), BAD},
    {CALL(NLIBCSzListPush(&given.pNoList, "b"), -1), BAD},
    {CALL(NLIBCSzListPush(&given.list.p, nullptr), -1), BAD},
    {CALL(NLIBCSzListPushHead(nullptr, "b"), -1), BAD},
    {CALL(NLIBCSzListPushHead(&given.pNoList, "b"), -1), BAD},
    {CALL(NLIBCSzListPushHead(&given.list.p, nullptr), -1), BAD},
    {CALL(NLIBCSzListInsert(nullptr, 0, "b"), -1), BAD},
    {CALL(NLIBCSzListInsert(&given.pNoList, 0, "b"), -1), BAD},
    {CALL(NLIBCSzListInsert(&given.list.p, 0, nullptr), -1), BAD},
    {CALL(NLIBCSzListInsert(&given.list.p, -1, "b"), -1), BAD},
    {CALL(NLIBCSzListInsert(&given.list.p, INT_MIN, "b"), -1), BAD},
    {CALL(NLIBCSzListGet(nullptr, 0), nullptr), BAD},
    {CALL(NLIBCSzListGet(given.list.p, -1), nullptr), BAD},
    {CALL(NLIBCSzListGet(given.list.p, 1), nullptr), BAD},
    {CALL(NLIBCSzListGet(given.empty.p, 0), nullptr), BAD},
    {CALL(NLIBCSzListFind(nullptr, "a"), -1), BAD},
    {CALL(NLIBCSzListFind(given.bytes.p, nullptr), -1), BAD},
    {CALL(NLIBCSzListFind(given.nocase.p, "a"), -1), BAD},
    {CALL(NLIBCSzListCaseFind(nullptr, "a"), -1), BAD},
    {CALL(NLIBCSzListCaseFind(given.nocase.p, nullptr), -1), BAD},
    {CALL(NLIBCSzListCaseFind(given.bytes.p, "a"), -1), BAD},
    {CALL(NLIBCSzListRemove(nullptr, 0), nullptr), BAD},
    {CALL(NLIBCSzListRemove(given.list.p, 1), nullptr), BAD},
    {CALL(NLIBCSzListRemove(given.list.p, -1), nullptr), BAD},
    {CALL(NLIBCSzListRemove(given.empty.p, 0), nullptr), BAD},
    {CALL(NLIBCSzListSet(nullptr, 0, "b"), -1), BAD},
    {CALL(NLIBCSzListSet(&given.pNoList, 0, "b"), -1), BAD},
    {CALL(NLIBCSzListSet(&given.list.p, 0, nullptr), -1), BAD},
    {CALL(NLIBCSzListSet(&given.list.p, 1, "b"), -1), BAD},
    {CALL(NLIBCSzListSet(&given.list.p, -1, "b"), -1), BAD},
    {CALL(NLIBCSzListExpand(nullptr), nullptr), BAD},
    {CALL((NLIBCSzListCompact(nullptr), 0), 0), BAD},
    {CALL((NLIBCSzListClear(nullptr), 0), 0), BAD},
    {CALL((NLIBCSzListSort(nullptr, SZLIST_SORTED), 0), 0), NO_CODE},
    {CALL((NLIBCSzListFree(nullptr), 0), 0), NO_CODE},
    {CALL(NLIBCSzListDump(nullptr), -1), BAD},
    {CALL(NLIBCSzListJoin(nullptr, ",", &given.psz, &given.cb), -1), BAD},
    {CALL(NLIBCSzListJoin(given.list.p, nullptr, &given.psz, &given.cb), -1), BAD},
    {CALL(NLIBCSzListJoin(given.list.p, ",", nullptr, &given.cb), -1), BAD},
    {CALL(NLIBCSzListJoin(given.list.p, ",", &given.pszNone, &given.cb), -1), BAD},
    {CALL(NLIBCSzListJoin(given.list.p, ",", &given.psz, nullptr), -1), BAD},
    {CALL(NLIBCSzListJoin(given.list.p, ",", &given.psz, &given.cbNegative), -1), BAD},
    {CALL(NLIBCSzListDump2Str(nullptr, ",", given.szText, 8), -1), BAD},
    {CALL(NLIBCSzListDump2Str(given.list.p, nullptr, given.szText, 8), -1), BAD},
    {CALL(NLIBCSzListDump2Str(given.list.p, ",", nullptr, 8), -1), BAD},
    {CALL(NLIBCSzListDump2Str(given.list.p, ",", given.szText, 0), -1), BAD},
    {CALL(NLIBCSzListDump2Str(given.list.p, ",", given.szText, -8), -1), BAD},
    {CALL(NLIBCSzListOr(nullptr, given.bytes.p, given.flags), nullptr), BAD},
    {CALL(NLIBCSzListOr(&given.pNoList, given.bytes.p, given.flags), nullptr), BAD},
    {CALL(NLIBCSzListOr(&given.bytes.p, nullptr, given.flags), nullptr), BAD},
    {CALL(NLIBCSzListOr(&given.bytes.p, given.nocase.p, given.flags), nullptr), BAD},
    {CALL(NLIBCSzListOr(&given.nocase.p, given.bytes.p, given.flags), nullptr), BAD},
    {CALL(NLIBCSzListOr(&given.list.p, given.unknown.p, given.flags), nullptr), BAD},
    // tables
    {CALL(NLIBCHashIndex(nullptr, 31), -1), NO_CODE},
    {CALL(NLIBCHashIndex("a", 0), -1), NO_CODE},
    {CALL(NLIBCHashIndex("", 0), -1), NO_CODE},
    {CALL(NLIBCHashAllocator(-1, 512), nullptr), BAD},
    {CALL(NLIBCHashAllocator(7, -1), nullptr), BAD},
    {CALL(NLIBCHashAllocator(INT_MIN, INT_MIN), nullptr), BAD},
    {CALL((NLIBCHashFree(nullptr), 0), 0), NO_CODE},
    {CALL(NLIBCHashSet(nullptr, "k", "v"), -1), NO_CODE},
    {CALL(NLIBCHashSet(&given.pNoHash, "k", "v"), -1), NO_CODE},
    {CALL(NLIBCHashSet(&given.hash.p, nullptr, "v"), -1), NO_CODE},
    {CALL(NLIBCHashSet(&given.hash.p, "k", nullptr), -1), NO_CODE},
    {CALL(NLIBCHashGet(nullptr, "k"), nullptr), NO_CODE},
    {CALL(NLIBCHashGet(given.hash.p, nullptr), nullptr), NO_CODE},
    {CALL(NLIBCHashKeyListGet(nullptr, &given.list.p), -1), NO_CODE},
    {CALL(NLIBCHashKeyListGet(nullptr, nullptr), -1), NO_CODE},
    // text
    {CALL(NLIBCStrTrimSpace(nullptr, nullptr), -1), BAD},
    {CALL(NLIBCStrTrimSpace(nullptr, given.szText), -1), BAD},
    {CALL(NLIBCStrSepNonEmpty(nullptr, ","), nullptr), NO_CODE},
    {CALL(NLIBCStrSepNonEmpty(&given.pszNone, ","), nullptr), NO_CODE},
    {CALL(NLIBCStrSepNonEmpty(&given.psz, nullptr), nullptr), NO_CODE},
    {CALL(NLIBCStrTok(nullptr, ",", &given.list.p), -1), BAD},
    {CALL(NLIBCStrTok("b", nullptr, &given.list.p), -1), BAD},
    {CALL(NLIBCStrTok("b", ",", nullptr), -1), BAD},
    {CALL(NLIBCStrTok("b", ",", &given.pNoList), -1), BAD},
    // files and their keys
    {CALL(NLIBCFileTouch(nullptr), -1), BAD},
    {CALL(NLIBCFileExist(nullptr), 0), NO_CODE},
    {CALL(NLIBCFileReadLines(nullptr, &given.list.p), -1), BAD},
    {CALL(NLIBCFileReadLines(given.szPath, nullptr), -1), BAD},
    {CALL(NLIBCFileReadLines(given.szPath, &given.pNoList), -1), BAD},
    {CALL(NLIBCFileLineKeyMatch(nullptr, "k"), 0), BAD},
    {CALL(NLIBCFileLineKeyMatch("k=v", nullptr), 0), BAD},
    {CALL(NLIBCFileGetKeyValue(nullptr, "k", given.szText, 8, 0), -1), BAD},
    {CALL(NLIBCFileGetKeyValue(given.szPath, nullptr, given.szText, 8, 0), -1), BAD},
    {CALL(NLIBCFileGetKeyValue(given.szPath, "k", given.szText, 8, -1), -1), BAD},
    {CALL(NLIBCFileGetKeyValue(given.szPath, "k", given.szText, 8, INT_MIN), -1), BAD},
    {CALL(NLIBCFileGetKeyValue(given.szPath, "k", nullptr, 8, 0), -1), BAD},
    {CALL(NLIBCFileGetKeyValue(given.szPath, "k", nullptr, -8, 0), -1), BAD},
    {CALL(NLIBCFileCheckKeyValue(nullptr, "k", "v", 1), 0), BAD},
    {CALL(NLIBCFileCheckKeyValue(given.szPath, nullptr, "v", 1), 0), BAD},
    {CALL(NLIBCFileCheckKeyValue(given.szPath, "k", nullptr, 1), 0), BAD},
    {CALL(NLIBCFgets(nullptr, 8, given.pStream), nullptr), BAD},
    {CALL(NLIBCFgets(given.szText, 0, given.pStream), nullptr), BAD},
    {CALL(NLIBCFgets(given.szText, -1, given.pStream), nullptr), BAD},
    {CALL(NLIBCFgets(given.szText, 8, nullptr), nullptr), BAD},
    {CALL(NLIBCRead(-1, given.szText, 8), -1), BAD},
    {CALL(NLIBCRead(fileno(given.pStream), nullptr, 8), -1), BAD},
    {CALL(NLIBCRead(fileno(given.pStream), given.szText, 0), -1), BAD},
    // programs
    {CALL(NLIBCExecl(nullptr, "a", nullptr), -1), BAD},
    {CALL(NLIBCPopen(nullptr, "r", nullptr), nullptr), BAD},
    {CALL(NLIBCPopen("/bin/true", nullptr, nullptr), nullptr), BAD},
    {CALL(NLIBCPopenV(nullptr, "r", given.argv), nullptr), BAD},
    {CALL(NLIBCPopenV("/bin/true", nullptr, given.argv), nullptr), BAD},
    {CALL(NLIBCPopenV("/bin/true", "r", nullptr), nullptr), BAD},
    {CALL(NLIBCPclose(nullptr), -1), BAD},
    // disks
    {CALL(DiskIndexGet(nullptr), -1), NO_CODE},
    {CALL(DiskPartitionNumGet(nullptr, given.szText, 32), -1), BAD},
    {CALL(DiskPartitionNumGet("sda1", nullptr, 32), -1), BAD},
    {CALL(DiskPartitionNumGet("sda1", given.szText, 0), -1), BAD},
    {CALL(DiskPartitionNumGet("sda1", given.szText, -1), -1), BAD},
    {CALL(DiskPartitionNumGet("sda1", given.szText, INT_MIN), -1), BAD},
    {CALL(DiskPartitionNumRemove(nullptr, given.szText, 32), -1), NO_CODE},
    {CALL(DiskPartitionNumRemove("sda1", nullptr, 32), -1), NO_CODE},
    {CALL(DiskPartitionNumRemove("sda1", given.szText, 0), -1), NO_CODE},
    {CALL(DiskPartitionNumRemove("sda1", given.szText, -1), -1), NO_CODE},
    {CALL(DiskPartitionNumRemove("sda1", given.szText, 4), -1), NO_CODE},
    {CALL(DiskIsExist(nullptr), -1), BAD},
    {CALL(DiskContainerFromPortType(INTERNAL_DEVICE, nullptr), -1), NO_CODE},
    {CALL(DiskContainerGet(nullptr, &given.mask), -1), NO_CODE},
    {CALL(DiskContainerGet("mmcblk0", nullptr), -1), NO_CODE},
    {CALL(DiskPathParse(nullptr, &given.info), -1), BAD},
    {CALL(DiskPathParse("mmcblk0", nullptr), -1), BAD},
};

TEST_ROWS(BadArguments, BAD_CALLS)
{
    constexpr int ERRNO_AT_ENTRY = ENOTTY; // no call here fails with it
    constexpr std::pair<int, int> LISTS_AND_FLAGS[] = {
        {SZLIST_UNSORTED, 0}, {SZLIST_SORTED, SZLIST_OR_NEW}, {SZLIST_CASE_SORTED, 0}};
    for (const auto &[fMode, flags] : LISTS_AND_FLAGS) {
        GIVEN given(fMode, flags);
        RecordReset();
        errno = ERRNO_AT_ENTRY;
        GetParam().expect(given);
        EXPECT_EQ(errno, ERRNO_AT_ENTRY);
        EXPECT_EQ(NLIBCErrGet(), GetParam().code);
        EXPECT_EQ(NLIBCErrGetLine() > 1, GetParam().code == BAD);
        ExpectUnchanged(given);
    }
}

} // namespace
