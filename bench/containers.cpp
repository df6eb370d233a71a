// SPDX-License-Identifier: MIT
//
// The project's containers beside those of the C++ library: time, and the heap that a filled one
// holds.
//
//   containers             Google Benchmark; takes its options (--benchmark_filter=push ...)
//   containers --counts    allocations and bytes as "NAME VALUE", for bench/gates
#include "nurocore/hash.h"
#include "nurocore/szlist.h"

#include <algorithm>
#include <benchmark/benchmark.h>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <malloc.h>
#include <new>
#include <set>
#include <string>
#include <unordered_map>
#include <vector>

// ---- the heap, watched -------------------------------------------------------------------------

namespace
{

struct HEAP_COUNTS {
    long nAllocation;
    long cbHeld;
};

HEAP_COUNTS g_heap;
bool g_fHeapWatched;

// What a block takes from the heap: its usable bytes and the word in front of them.
long BlockSize(void *p)
{
    return p == nullptr ? 0 : static_cast<long>(malloc_usable_size(p) + sizeof(size_t));
}

void *BlockTaken(void *p)
{
    if (g_fHeapWatched) {
        g_heap.nAllocation++;
        g_heap.cbHeld += BlockSize(p);
    }
    return p;
}

void BlockGiven(void *p)
{
    if (g_fHeapWatched) {
        g_heap.cbHeld -= BlockSize(p);
    }
}

} // namespace

// The linker leads every call from this program's own objects here.
extern "C" {
void *__real_malloc(size_t cb);
void *__real_calloc(size_t n, size_t cb);
void *__real_realloc(void *p, size_t cb);
void __real_free(void *p);
void *__wrap_malloc(size_t cb);
void *__wrap_calloc(size_t n, size_t cb);
void *__wrap_realloc(void *p, size_t cb);
void __wrap_free(void *p);

void *__wrap_malloc(size_t cb)
{
    return BlockTaken(__real_malloc(cb));
}

void *__wrap_calloc(size_t n, size_t cb)
{
    return BlockTaken(__real_calloc(n, cb));
}

void *__wrap_realloc(void *p, size_t cb)
{
    BlockGiven(p);
    return BlockTaken(__real_realloc(p, cb));
}

void __wrap_free(void *p)
{
    BlockGiven(p);
    __real_free(p);
}
}

void *operator new(size_t cb)
{
    return malloc(cb);
}

void operator delete(void *p) noexcept
{
    free(p);
}

void operator delete(void *p, size_t) noexcept
{
    free(p);
}

namespace
{

// ---- what is stored ----------------------------------------------------------------------------

constexpr int ITEM_LENGTH = 20;
constexpr int LIST_BLOCK = 512;
constexpr int HASH_POOL = 512;
constexpr int SMALL = 10;
constexpr int MEDIUM = 1000;
constexpr int LARGE = 100000;

// Names of 20 characters in no order, the same in every run.
std::vector<std::string> Items(std::int64_t nItem)
{
    std::vector<std::string> items;
    std::uint64_t seed = 42;
    for (std::int64_t i = 0; i < nItem; i++) {
        seed = seed * 6364136223846793005ULL + 1442695040888963407ULL;
        char szItem[64];
        (void)snprintf(szItem, sizeof(szItem), "/dev/%015llx",
                       static_cast<unsigned long long>(seed >> 4U));
        items.emplace_back(szItem, ITEM_LENGTH);
    }
    return items;
}

struct LIST {
    PNLIBSZLIST pList = NLIBCSzListAlloc(LIST_BLOCK);

    LIST() = default;
    LIST(const LIST &) = delete;
    LIST &operator=(const LIST &) = delete;
    ~LIST()
    {
        NLIBCSzListFree(pList);
    }
};

struct HASH {
    PNLIBHASH pHash = NLIBCHashAlloc(HASH_POOL);

    HASH() = default;
    HASH(const HASH &) = delete;
    HASH &operator=(const HASH &) = delete;
    ~HASH()
    {
        NLIBCHashFree(pHash);
    }
};

struct SORTED_LIST : LIST {
    SORTED_LIST()
    {
        NLIBCSzListSort(pList, SZLIST_SORTED);
    }
};

using STD_VECTOR = std::vector<std::string>;
using STD_SET = std::set<std::string>;
using STD_MAP = std::unordered_map<std::string, std::string>;

// ---- filling, one function a container ---------------------------------------------------------

void Fill(LIST &list, const std::vector<std::string> &items)
{
    for (const std::string &szItem : items) {
        (void)NLIBCSzListPush(&list.pList, szItem.c_str());
    }
}

void Fill(STD_VECTOR &strings, const std::vector<std::string> &items)
{
    for (const std::string &szItem : items) {
        strings.emplace_back(szItem.c_str());
    }
}

void Fill(STD_SET &strings, const std::vector<std::string> &items)
{
    for (const std::string &szItem : items) {
        strings.emplace(szItem.c_str());
    }
}

void Fill(HASH &hash, const std::vector<std::string> &items)
{
    for (const std::string &szItem : items) {
        (void)NLIBCHashSet(&hash.pHash, szItem.c_str(), szItem.c_str());
    }
}

void Fill(STD_MAP &map, const std::vector<std::string> &items)
{
    for (const std::string &szItem : items) {
        map.insert_or_assign(szItem.c_str(), szItem.c_str());
    }
}

template <typename CONTAINER>
HEAP_COUNTS HeapOf(const std::vector<std::string> &items)
{
    g_heap = {};
    g_fHeapWatched = true;
    CONTAINER container;
    Fill(container, items);
    g_fHeapWatched = false;
    return g_heap;
}

template <typename CONTAINER>
void BM_Fill(benchmark::State &state)
{
    const std::vector<std::string> items = Items(state.range(0));
    for ([[maybe_unused]] auto step : state) {
        CONTAINER container;
        Fill(container, items);
        benchmark::DoNotOptimize(container);
    }
    const HEAP_COUNTS heap = HeapOf<CONTAINER>(items);
    state.counters["bytes"] = static_cast<double>(heap.cbHeld);
    state.counters["allocations"] = static_cast<double>(heap.nAllocation);
    state.SetItemsProcessed(state.iterations() * state.range(0));
}

// ---- finding -----------------------------------------------------------------------------------

bool Find(const SORTED_LIST &list, const std::string &szItem)
{
    return NLIBCSzListFind(list.pList, szItem.c_str()) >= 0;
}

bool Find(const LIST &list, const std::string &szItem)
{
    return NLIBCSzListFind(list.pList, szItem.c_str()) >= 0;
}

bool Find(const STD_VECTOR &strings, const std::string &szItem)
{
    return std::find(strings.begin(), strings.end(), szItem) != strings.end();
}

bool Find(const STD_SET &strings, const std::string &szItem)
{
    return strings.find(szItem) != strings.end();
}

bool Find(const HASH &hash, const std::string &szItem)
{
    return NLIBCHashGet(hash.pHash, szItem.c_str()) != nullptr;
}

bool Find(const STD_MAP &map, const std::string &szItem)
{
    return map.find(szItem) != map.end();
}

template <typename CONTAINER>
void BM_Find(benchmark::State &state)
{
    constexpr size_t STRIDE = 7919; // a prime: no order that a processor could foresee
    const std::vector<std::string> items = Items(state.range(0));
    CONTAINER container;
    Fill(container, items);
    size_t index = 0;
    for ([[maybe_unused]] auto step : state) {
        index = (index + STRIDE) % items.size();
        if (!Find(container, items[index])) {
            state.SkipWithError("an item is gone");
        }
    }
    state.SetItemsProcessed(state.iterations());
}

// ---- growing and joining -----------------------------------------------------------------------

void Grow(LIST &list)
{
    NLIBSZLIST *const pNew = NLIBCSzListExpand(list.pList);
    list.pList = pNew == nullptr ? list.pList : pNew;
}

void Grow(STD_VECTOR &strings)
{
    strings.reserve(strings.capacity() * 2);
}

template <typename CONTAINER>
void BM_Expand(benchmark::State &state)
{
    const std::vector<std::string> items = Items(state.range(0));
    for ([[maybe_unused]] auto step : state) {
        state.PauseTiming();
        {
            CONTAINER container;
            Fill(container, items);
            state.ResumeTiming();
            Grow(container);
            benchmark::DoNotOptimize(container);
            state.PauseTiming();
        }
        state.ResumeTiming();
    }
    state.SetItemsProcessed(state.iterations() * state.range(0));
}

void BM_JoinList(benchmark::State &state)
{
    LIST list;
    Fill(list, Items(state.range(0)));
    for ([[maybe_unused]] auto step : state) {
        int cbText = LIST_BLOCK;
        auto *pszText = static_cast<char *>(malloc(LIST_BLOCK));
        benchmark::DoNotOptimize(NLIBCSzListJoin(list.pList, " ", &pszText, &cbText));
        free(pszText);
    }
    state.SetItemsProcessed(state.iterations() * state.range(0));
}

void BM_JoinVector(benchmark::State &state)
{
    const STD_VECTOR strings = Items(state.range(0));
    for ([[maybe_unused]] auto step : state) {
        std::string szText;
        for (const std::string &szItem : strings) {
            szText += szItem;
            szText += ' ';
        }
        benchmark::DoNotOptimize(szText);
    }
    state.SetItemsProcessed(state.iterations() * state.range(0));
}

template <typename CONTAINER>
void CountsPrint(const char *szName)
{
    for (const int nItem : {SMALL, MEDIUM, LARGE}) {
        const HEAP_COUNTS heap = HeapOf<CONTAINER>(Items(nItem));
        (void)printf("%s_%d_allocations %ld\n%s_%d_bytes %ld\n", szName, nItem, heap.nAllocation,
                     szName, nItem, heap.cbHeld);
    }
}

void Sizes(benchmark::internal::Benchmark *pBenchmark)
{
    pBenchmark->Arg(SMALL)->Arg(MEDIUM)->Arg(LARGE);
}

BENCHMARK(BM_Fill<LIST>)->Name("push/list")->Apply(Sizes);
BENCHMARK(BM_Fill<STD_VECTOR>)->Name("push/std::vector")->Apply(Sizes);
BENCHMARK(BM_Fill<SORTED_LIST>)->Name("sorted insert/list")->Apply(Sizes);
BENCHMARK(BM_Fill<STD_SET>)->Name("sorted insert/std::set")->Apply(Sizes);
BENCHMARK(BM_Find<SORTED_LIST>)->Name("find sorted/list")->Apply(Sizes);
BENCHMARK(BM_Find<STD_SET>)->Name("find sorted/std::set")->Apply(Sizes);
BENCHMARK(BM_Find<LIST>)->Name("find/list")->Apply(Sizes);
BENCHMARK(BM_Find<STD_VECTOR>)->Name("find/std::vector")->Apply(Sizes);
BENCHMARK(BM_Expand<LIST>)->Name("expand/list")->Apply(Sizes)->Iterations(20);
BENCHMARK(BM_Expand<STD_VECTOR>)->Name("expand/std::vector")->Apply(Sizes)->Iterations(20);
BENCHMARK(BM_JoinList)->Name("join/list")->Apply(Sizes);
BENCHMARK(BM_JoinVector)->Name("join/std::vector")->Apply(Sizes);
BENCHMARK(BM_Fill<HASH>)->Name("set/hash")->Apply(Sizes);
BENCHMARK(BM_Fill<STD_MAP>)->Name("set/std::unordered_map")->Apply(Sizes);
BENCHMARK(BM_Find<HASH>)->Name("get/hash")->Apply(Sizes);
BENCHMARK(BM_Find<STD_MAP>)->Name("get/std::unordered_map")->Apply(Sizes);

} // namespace

int main(int argc, char **argv)
{
    if (argc == 2 && strcmp(argv[1], "--counts") == 0) {
        CountsPrint<LIST>("list");
        CountsPrint<HASH>("hash");
        return 0;
    }
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv)) {
        return 1;
    }
    benchmark::RunSpecifiedBenchmarks();
    return 0;
}
