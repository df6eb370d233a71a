// SPDX-License-Identifier: MIT
//
// Thousands of random operations on a list and on a plain vector; both must tell the same after
// every one of them, down to the bytes that are free.
#include "nurocore/szlist.h"

#include "test_error.h"
#include "test_szlist.h"

#include <algorithm>
#include <cctype>
#include <optional>
#include <random>
#include <strings.h>

namespace
{

struct MODEL {
    std::vector<std::optional<std::string>> items; // without a value: an empty slot
    i32 nSize = 512;
    i32 nFree = 488;
    int fMode = 0;
};

i32 CountOf(const MODEL &model)
{
    return static_cast<i32>(model.items.size());
}

i32 BytesOf(const std::string &text)
{
    return static_cast<i32>(text.size()) + 1;
}

std::string TextOf(const MODEL &model, int index)
{
    return model.items[static_cast<size_t>(index)].value_or("");
}

// The difference of the first lower-cased bytes that differ.
int DifferenceNoCase(const std::string &key, const std::string &item)
{
    for (size_t i = 0;; i++) {
        const int a = i < key.size() ? tolower(static_cast<unsigned char>(key[i])) : 0;
        const int b = i < item.size() ? tolower(static_cast<unsigned char>(item[i])) : 0;
        if (a != b || a == 0) {
            return a - b;
        }
    }
}

int Difference(int fMode, const std::string &key, const std::string &item)
{
    return fMode == SZLIST_CASE_SORTED ? DifferenceNoCase(key, item) : key.compare(item);
}

int ModelSearch(const MODEL &model, const std::string &key)
{
    int low = 0;
    int high = CountOf(model) - 1;
    while (low <= high) {
        const int middle = (low + high) / 2;
        const int difference = Difference(model.fMode, key, TextOf(model, middle));
        if (difference == 0) {
            return middle;
        }
        if (model.fMode == SZLIST_CASE_SORTED && difference == -2) {
            return ~low;
        }
        (difference > 0 ? low : high) = difference > 0 ? middle + 1 : middle - 1;
    }
    return ~low;
}

void ModelExpand(MODEL &model)
{
    model.nSize *= 2;
    model.nFree = model.nSize - 24 - 4 * CountOf(model);
    for (const auto &item : model.items) {
        model.nFree -= item.has_value() ? BytesOf(*item) : 0;
    }
}

int ModelInsert(MODEL &model, int index, const std::string &text)
{
    if (model.fMode != SZLIST_UNSORTED) {
        const int found = ModelSearch(model, text);
        index = found < 0 ? ~found : found;
    }
    const i32 nSlots = index < CountOf(model) ? 1 : index - CountOf(model) + 1;
    const i32 nNeeded = nSlots * 4 + BytesOf(text);
    while (nNeeded > model.nFree) {
        ModelExpand(model);
    }
    model.nFree -= nNeeded;
    if (index > CountOf(model)) {
        model.items.resize(static_cast<size_t>(index));
    }
    model.items.insert(model.items.begin() + index, text);
    return index;
}

void ModelOrder(MODEL &model, int fMode)
{
    std::stable_sort(model.items.begin(), model.items.end(), [&](const auto &a, const auto &b) {
        return Difference(fMode, a.value_or(""), b.value_or("")) < 0;
    });
}

void ModelCompact(MODEL &model)
{
    const i32 nBefore = CountOf(model);
    std::erase(model.items, std::nullopt);
    model.nFree += 4 * (nBefore - CountOf(model));
}

void ModelSort(MODEL &model, int fMode)
{
    if (model.fMode == SZLIST_UNSORTED) {
        ModelCompact(model);
        if (fMode != SZLIST_UNSORTED) {
            ModelOrder(model, fMode);
        }
    }
    model.fMode = fMode;
}

int ModelFind(const MODEL &model, const std::string &key, bool fNoCase)
{
    if (model.fMode != SZLIST_UNSORTED) {
        const bool isRefused = fNoCase != (model.fMode == SZLIST_CASE_SORTED);
        return isRefused ? -1 : std::max(-1, ModelSearch(model, key));
    }
    for (int i = 0; i < CountOf(model); i++) {
        const auto &item = model.items[static_cast<size_t>(i)];
        if (item.has_value() &&
            (fNoCase ? strcasecmp(item->c_str(), key.c_str()) == 0 : *item == key)) {
            return i;
        }
    }
    return -1;
}

int ModelSet(MODEL &model, int index, const std::string &text)
{
    if (BytesOf(text) > BytesOf(TextOf(model, index))) {
        model.nFree -= BytesOf(text);
    }
    model.items[static_cast<size_t>(index)] = text;
    if (model.fMode == SZLIST_UNSORTED) {
        return index;
    }
    ModelOrder(model, model.fMode);
    return model.fMode == SZLIST_SORTED ? ModelSearch(model, text) : -1;
}

std::string Compare(const NLIBSZLIST *pList, const MODEL &model)
{
    if (pList->nItem != CountOf(model) || pList->fMode != model.fMode) {
        return "count or mode differ";
    }
    if (pList->nSize != model.nSize || pList->nFree != model.nFree) {
        return "size " + std::to_string(pList->nSize) + ", free " + std::to_string(pList->nFree) +
               " instead of " + std::to_string(model.nSize) + ", " + std::to_string(model.nFree);
    }
    for (int i = 0; i < CountOf(model); i++) {
        if (NLIBCSzListGet(pList, i) != TextOf(model, i) ||
            IsEmptySlot(pList, i) == model.items[static_cast<size_t>(i)].has_value()) {
            return "item " + std::to_string(i) + " differs";
        }
    }
    return Defect(pList);
}

struct RANDOM {
    std::mt19937 engine{20080516};

    int Below(int n)
    {
        return static_cast<int>(engine() % static_cast<unsigned int>(n));
    }
    // Few letters, so that equals and neighbours two apart come often; never empty.
    std::string Text()
    {
        const int cch = Below(20) == 0 ? 1 + Below(300) : 1 + Below(3);
        std::string text;
        for (int i = 0; i < cch; i++) {
            text += "abcdeABCDE_"[Below(11)];
        }
        return text;
    }
};

void StepGrow(RANDOM &random, TEST_LIST &list, MODEL &model)
{
    const std::string text = random.Text();
    const int nItem = CountOf(model);
    switch (random.Below(4)) {
    case 0:
        ASSERT_EQ(NLIBCSzListPush(&list.p, text.c_str()), ModelInsert(model, nItem, text));
        break;
    case 1:
        ASSERT_EQ(NLIBCSzListPushHead(&list.p, text.c_str()), ModelInsert(model, 0, text));
        break;
    case 2: {
        const int index = random.Below(nItem + 6);
        ASSERT_EQ(NLIBCSzListInsert(&list.p, index, text.c_str()), ModelInsert(model, index, text));
        break;
    }
    default:
        if (nItem > 0) { // a string of the list's own
            const int index = random.Below(nItem);
            const std::string own = TextOf(model, index);
            if (!own.empty()) {
                ASSERT_EQ(NLIBCSzListPush(&list.p, NLIBCSzListGet(list.p, index)),
                          ModelInsert(model, nItem, own));
            }
        }
    }
}

void StepChange(RANDOM &random, TEST_LIST &list, MODEL &model)
{
    if (model.items.empty()) {
        return;
    }
    const int index = random.Below(CountOf(model));
    if (random.Below(2) == 0) {
        ASSERT_EQ(NLIBCSzListRemove(list.p, index), TextOf(model, index));
        model.items.erase(model.items.begin() + index);
        model.nFree += 4;
        return;
    }
    const std::string text = random.Text();
    if (BytesOf(text) <= model.nFree) {
        const int expected = ModelSet(model, index, text);
        ASSERT_EQ(NLIBCSzListSet(&list.p, index, text.c_str()), expected);
    }
}

void StepLook(RANDOM &random, const TEST_LIST &list, const MODEL &model)
{
    const std::string text = random.Text();
    ASSERT_EQ(NLIBCSzListFind(list.p, text.c_str()), ModelFind(model, text, false));
    ASSERT_EQ(NLIBCSzListCaseFind(list.p, text.c_str()), ModelFind(model, text, true));
}

void StepWhole(RANDOM &random, TEST_LIST &list, MODEL &model)
{
    constexpr int MODES[] = {SZLIST_UNSORTED, SZLIST_SORTED, SZLIST_CASE_SORTED};
    switch (random.Below(5)) {
    case 0:
        NLIBCSzListCompact(list.p);
        ModelCompact(model);
        break;
    case 1:
        if (CountOf(model) > 60) {
            NLIBCSzListClear(list.p);
            model.items.clear();
            model.nFree = model.nSize - 24;
        }
        break;
    case 2:
        if (model.nSize < 65536) {
            list.p = NLIBCSzListExpand(list.p);
            ModelExpand(model);
        }
        break;
    default: {
        const int fMode = MODES[random.Below(3)];
        NLIBCSzListSort(list.p, fMode);
        ModelSort(model, fMode);
    }
    }
}

TEST(SzListRandom, TellsTheSameAsAVector)
{
    RANDOM random;
    for (int nRound = 0; nRound < 20; nRound++) {
        TEST_LIST list(512);
        MODEL model;
        for (int nStep = 0; nStep < 400; nStep++) {
            const int dice = random.Below(20);
            if (dice < 10) {
                StepGrow(random, list, model);
            } else if (dice < 15) {
                StepChange(random, list, model);
            } else if (dice < 18) {
                StepLook(random, list, model);
            } else {
                StepWhole(random, list, model);
            }
            ASSERT_FALSE(HasFatalFailure()) << "round " << nRound << " step " << nStep;
            ASSERT_EQ(Compare(list.p, model), "") << "round " << nRound << " step " << nStep;
        }
    }
}

} // namespace
