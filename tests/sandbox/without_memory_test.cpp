// SPDX-License-Identifier: MIT
//
// What a library function answers when an allocation fails in the middle of it: the lists and the
// readers that fill them.
#include "hwcontrol/disk_port.h"
#include "nurocore/error.h"
#include "nurocore/file.h"
#include "nurocore/keyvalue.h"
#include "nurocore/pipe.h"
#include "nurocore/szlist.h"
#include "nurocore/text.h"
#include "nurostoragecore/partition_enum.h"
#include "steps.h"

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <functional>
#include <gtest/gtest.h>
#include <string>
#include <unistd.h>

namespace
{

constexpr int CALLS_MAX = 40;
constexpr int LONG_LENGTH = 300; // two of them do not fit a new list

// Runs the body CALLS_MAX times, failing the first allocation, then the second and so on, and says
// how many runs gave the wanted answer. The body returns what it has seen.
int TimesSeen(MACHINE machine, const char *szFunction, const std::string &szWanted,
              const std::function<std::string()> &body)
{
    int nSeen = 0;
    for (int nCall = 1; nCall <= CALLS_MAX; nCall++) {
        machine.faults = {{.szFunction = szFunction, .nCall = nCall, .error = ENOMEM}};
        const RUN_RESULT result = MachineCall(machine, [&body] { printf("%s", body().c_str()); });
        nSeen += result.szOut == szWanted ? 1 : 0;
    }
    return nSeen;
}

// "answer code": what a call said, and what stands in the record.
std::string Told(long answer)
{
    char sz[64] = "";
    (void)snprintf(sz, sizeof(sz), "%ld %X", answer, NLIBCErrGet());
    return sz;
}

// And how many items its list has then.
std::string ToldWithItems(long answer, const PNLIBSZLIST &pList)
{
    return Told(answer) + " " + std::to_string(pList->nItem);
}

struct LIST_SCOPE {
    PNLIBSZLIST p;

    LIST_SCOPE(int nItem, char ch, int fMode) : p(NLIBCSzListAlloc(512))
    {
        char szItem[LONG_LENGTH + 1] = "";
        for (int i = 0; p != nullptr && i < nItem; i++) {
            memset(szItem, ch + i, LONG_LENGTH);
            (void)NLIBCSzListPush(&p, szItem);
        }
        NLIBCSzListSort(p, fMode);
        RecordReset();
    }
    LIST_SCOPE(const LIST_SCOPE &) = delete;
    LIST_SCOPE &operator=(const LIST_SCOPE &) = delete;
    ~LIST_SCOPE()
    {
        NLIBCSzListFree(p);
    }
};

// One item each in two lists; the other's has no room in this one.
struct OR_CASE {
    const char *szName;
    int fModeThis;
    int fModeOther;
    int flags;
};

constexpr OR_CASE OR_CASES[] = {
    {"unsorted, in place", SZLIST_UNSORTED, SZLIST_UNSORTED, 0},
    {"sorted other, in place", SZLIST_UNSORTED, SZLIST_SORTED, 0},
    {"sorted other, in place, nothing removed", SZLIST_UNSORTED, SZLIST_SORTED, 1},
    {"both sorted, in place", SZLIST_SORTED, SZLIST_SORTED, 0},
    {"sorted, in place", SZLIST_SORTED, SZLIST_UNSORTED, 0},
    {"new", SZLIST_UNSORTED, SZLIST_UNSORTED, SZLIST_OR_NEW},
    {"sorted, new", SZLIST_SORTED, SZLIST_UNSORTED, SZLIST_OR_NEW},
    {"sorted other, new", SZLIST_UNSORTED, SZLIST_SORTED, SZLIST_OR_NEW},
    {"both sorted, new", SZLIST_SORTED, SZLIST_SORTED, SZLIST_OR_NEW},
};

TEST(WithoutMemory, MergedListsAreNone)
{
    for (const OR_CASE &row : OR_CASES) {
        SCOPED_TRACE(row.szName);
        const auto body = [&row] {
            LIST_SCOPE list(1, 'a', row.fModeThis);
            const LIST_SCOPE other(1, 'b', row.fModeOther);
            if (list.p == nullptr || other.p == nullptr || list.p->nItem + other.p->nItem != 2) {
                return std::string("no lists");
            }
            PNLIBSZLIST const pMerged = NLIBCSzListOr(&list.p, other.p, row.flags);
            const std::string szTold = Told(pMerged == nullptr ? 0 : pMerged->nItem);
            if (pMerged != list.p) {
                NLIBCSzListFree(pMerged);
            }
            return szTold;
        };
        EXPECT_EQ(TimesSeen(MachineMake(), "malloc", "0 200", body), 1);
    }
}

// A body on a new list of so many long items.
std::function<std::string()> OnList(int nItem,
                                    const std::function<std::string(PNLIBSZLIST &)> &body)
{
    return [nItem, body] {
        LIST_SCOPE list(nItem, 'a', SZLIST_UNSORTED);
        return list.p == nullptr || list.p->nItem != nItem ? "no list" : body(list.p);
    };
}

// A failed growth leaves the list to its owner.
TEST(WithoutMemory, AListThatCannotGrowStaysAsItWas)
{
    const auto body = OnList(1, [](PNLIBSZLIST &pList) {
        PNLIBSZLIST const pGrown = NLIBCSzListExpand(pList);
        if (pGrown != nullptr) {
            pList = pGrown;
            return std::string("grown");
        }
        return Told(pList->nItem) + NLIBCSzListGet(pList, 0)[LONG_LENGTH - 1];
    });
    EXPECT_EQ(TimesSeen(MachineMake(), "malloc", "1 200a", body), 1);
}

// Four fields, of which two fit.
TEST(WithoutMemory, FieldsAreNotSplit)
{
    const std::string szField(200, 'x');
    const std::string szText = szField + " " + szField + " " + szField + " " + szField;
    const auto body = OnList(0, [&szText](PNLIBSZLIST &pList) {
        return ToldWithItems(NLIBCStrTok(szText.c_str(), " ", &pList), pList);
    });
    EXPECT_EQ(TimesSeen(MachineMake(), "malloc", "-1 200 2", body), 1) << "the list";
    EXPECT_EQ(TimesSeen(MachineMake(), "strdup", "-1 200 0", body), 1) << "the copy";
}

TEST(WithoutMemory, LinesAreNotRead)
{
    const MACHINE machine = WithFile(MachineMake(), "/tmp/lines",
                                     std::string(400, 'x') + "\n" + std::string(400, 'y') + "\n");
    const auto body = OnList(0, [](PNLIBSZLIST &pList) {
        return ToldWithItems(NLIBCFileReadLines("/tmp/lines", &pList), pList);
    });
    EXPECT_EQ(TimesSeen(machine, "malloc", "-1 200 1", body), 1);
}

TEST(WithoutMemory, ALineMatchesNoKey)
{
    const auto call = [] {
        EXPECT_EQ(NLIBCFileLineKeyMatch("key=value\n", "key"), 0);
        return NLIBCFileLineKeyMatch("key=value\n", "key");
    };
    (void)ExpectCall({.szName = "a line",
                      .machine = WithFault(MachineMake(), {.szFunction = "strndup"}),
                      .call = call,
                      .result = 1,
                      .steps = {{"fault strndup 1"}}});
}

// Fills the list with an item of this length, without an allocation of its own.
void FillerPush(PNLIBSZLIST &pList, size_t cch)
{
    char szFiller[LONG_LENGTH + 1] = "";
    memset(szFiller, 'b', cch);
    (void)NLIBCSzListPush(&pList, szFiller);
}

// The list is full, so that the first disk makes it grow.
TEST(WithoutMemory, DisksAreNotEnumerated)
{
    MACHINE machine = MachineWithConf("usbportcfg=0x10\ninternalportcfg=0xf\n");
    MachineDiskAdd(machine, "sda");
    const auto body = OnList(1, [](PNLIBSZLIST &pList) {
        FillerPush(pList, 174);
        return ToldWithItems(ExternalDiskPortEnum(INTERNAL_DEVICE, &pList), pList);
    });
    EXPECT_EQ(TimesSeen(machine, "malloc", "-1 200 2", body), 1);
}

// The list of paths is full of others, so that the first line makes it grow.
TEST(WithoutMemory, PartitionsAreNotEnumerated)
{
    MACHINE machine = MachineMake();
    MachineDiskAdd(machine, "sda");
    const auto body = OnList(1, [](PNLIBSZLIST &pList) {
        FillerPush(pList, 170);
        return Told(PartitionPathEnum(nullptr, &pList));
    });
    EXPECT_GE(TimesSeen(machine, "malloc", "-1 200", body), 3);
}

TEST(WithoutMemory, NoToolIsPiped)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, "/sbin/pvs", {.nTimes = ANY_TIMES});
    machine.faults = {{.szFunction = "calloc", .error = ENOMEM, .fGoOn = true}};
    const RUN_RESULT result = QuietCall(machine, [] {
        EXPECT_FAILS(NLIBCPopen("/sbin/pvs", "r", NULL), nullptr, ERR_OUT_OF_MEMORY);
    });
    EXPECT_EQ(TranscriptText(result), "fault calloc 1\n");
}

// The pipe is there before the memory for its record, and stays.
TEST(WithoutMemory, APipeWithoutARecordStaysOpen)
{
    MACHINE machine = MachineMake();
    MachineTool(machine, "/sbin/pvs", {.nTimes = ANY_TIMES});
    machine.faults = {{.szFunction = "calloc", .error = ENOMEM}};
    const RUN_RESULT result = QuietCall(machine, [] {
        char szTool[] = "/sbin/pvs";
        char *argv[] = {szTool, nullptr};
        const int fdFirst = dup(STDERR_FILENO);
        const int fdSecond = dup(STDERR_FILENO);
        const int fdThird = dup(STDERR_FILENO);
        (void)close(fdFirst);
        (void)close(fdSecond);
        (void)close(fdThird);
        EXPECT_FAILS(NLIBCPopenV(szTool, "r", argv), nullptr, ERR_OUT_OF_MEMORY);
        EXPECT_EQ(fcntl(fdFirst, F_GETFD), FD_CLOEXEC);
        EXPECT_EQ(fcntl(fdSecond, F_GETFD), FD_CLOEXEC);
        EXPECT_EQ(fcntl(fdThird, F_GETFD), -1);
    });
    EXPECT_EQ(TranscriptText(result), "fault calloc 1\n");
}

} // namespace
