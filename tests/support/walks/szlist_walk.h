// SPDX-License-Identifier: MIT
#pragma once

// A string list once more, as a plain vector, and a walk through the operations on both: what must
// be told after every one of them, down to the bytes that are free.

#include "decisions.h"
#include "test_szlist.h"

#include <algorithm>
#include <cctype>
#include <optional>
#include <string>
#include <strings.h>
#include <vector>

struct SZLIST_MODEL {
    std::vector<std::optional<std::string>> items; // without a value: an empty slot
    i32 nSize = 512;
    i32 nFree = 488;
    int fMode = 0;
};

inline i32 CountOf(const SZLIST_MODEL &model)
{
    return static_cast<i32>(model.items.size());
}

inline i32 BytesOf(const std::string &text)
{
    return static_cast<i32>(text.size()) + 1;
}

inline std::string TextOf(const SZLIST_MODEL &model, int index)
{
    return model.items[static_cast<size_t>(index)].value_or("");
}

// The difference of the first lower-cased bytes that differ.
inline int DifferenceNoCase(const std::string &key, const std::string &item)
{
    for (size_t i = 0;; i++) {
        const int a = i < key.size() ? tolower(static_cast<unsigned char>(key[i])) : 0;
        const int b = i < item.size() ? tolower(static_cast<unsigned char>(item[i])) : 0;
        if (a != b || a == 0) {
            return a - b;
        }
    }
}

inline int Difference(int fMode, const std::string &key, const std::string &item)
{
    return fMode == SZLIST_CASE_SORTED ? DifferenceNoCase(key, item) : key.compare(item);
}

inline int ModelSearch(const SZLIST_MODEL &model, const std::string &key)
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

inline void ModelExpand(SZLIST_MODEL &model)
{
    model.nSize *= 2;
    model.nFree = model.nSize - 24 - 4 * CountOf(model);
    for (const auto &item : model.items) {
        model.nFree -= item.has_value() ? BytesOf(*item) : 0;
    }
}

inline int ModelInsert(SZLIST_MODEL &model, int index, const std::string &text)
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

inline void ModelOrder(SZLIST_MODEL &model, int fMode)
{
    const auto less = [&](const auto &a, const auto &b) {
        return Difference(fMode, a.value_or(""), b.value_or("")) < 0;
    };
    // Each goes behind what it equals.
    for (auto item = model.items.begin(); item != model.items.end(); ++item) {
        std::rotate(std::upper_bound(model.items.begin(), item, *item, less), item, item + 1);
    }
}

inline void ModelCompact(SZLIST_MODEL &model)
{
    const i32 nBefore = CountOf(model);
    std::erase(model.items, std::nullopt);
    model.nFree += 4 * (nBefore - CountOf(model));
}

inline void ModelSort(SZLIST_MODEL &model, int fMode)
{
    if (model.fMode == SZLIST_UNSORTED) {
        ModelCompact(model);
        if (fMode != SZLIST_UNSORTED) {
            ModelOrder(model, fMode);
        }
    }
    model.fMode = fMode;
}

inline int ModelFind(const SZLIST_MODEL &model, const std::string &key, bool fNoCase)
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

inline int ModelSet(SZLIST_MODEL &model, int index, const std::string &text)
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

inline std::string Compare(const NLIBSZLIST *pList, const SZLIST_MODEL &model)
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

// ---- the walk ----------------------------------------------------------------------------------

struct SZLIST_WALK {
    DECISIONS decisions;
    TEST_LIST list{512};
    SZLIST_MODEL model{};
    std::string defect{};

    std::string Text()
    {
        return decisions.Text("abcdeABCDE_");
    }
    void Equal(int result, int expected, const char *szClaim)
    {
        Hold(defect, result == expected, szClaim);
    }
};

inline void StepGrow(SZLIST_WALK &walk)
{
    PNLIBSZLIST *const ppList = &walk.list.p;
    const std::string text = walk.Text();
    const int nItem = CountOf(walk.model);
    switch (walk.decisions.Below(4)) {
    case 0:
        walk.Equal(NLIBCSzListPush(ppList, text.c_str()), ModelInsert(walk.model, nItem, text),
                   "push");
        break;
    case 1:
        walk.Equal(NLIBCSzListPushHead(ppList, text.c_str()), ModelInsert(walk.model, 0, text),
                   "push at the head");
        break;
    case 2: {
        const int index = walk.decisions.Below(nItem + 6);
        walk.Equal(NLIBCSzListInsert(ppList, index, text.c_str()),
                   ModelInsert(walk.model, index, text), "insert");
        break;
    }
    default:
        if (nItem > 0) { // a string of the list's own
            const int index = walk.decisions.Below(nItem);
            const std::string own = TextOf(walk.model, index);
            if (!own.empty()) {
                walk.Equal(NLIBCSzListPush(ppList, NLIBCSzListGet(*ppList, index)),
                           ModelInsert(walk.model, nItem, own), "push of an item");
            }
        }
    }
}

inline void StepChange(SZLIST_WALK &walk)
{
    SZLIST_MODEL &model = walk.model;
    if (model.items.empty()) {
        Hold(walk.defect, NLIBCSzListRemove(walk.list.p, 0) == nullptr, "nothing to remove");
        return;
    }
    const int index = walk.decisions.Below(CountOf(model));
    if (walk.decisions.Below(2) == 0) {
        Hold(walk.defect, NLIBCSzListRemove(walk.list.p, index) == TextOf(model, index), "remove");
        model.items.erase(model.items.begin() + index);
        model.nFree += 4;
        return;
    }
    const std::string text = walk.Text();
    if (BytesOf(text) <= model.nFree) {
        const int expected = ModelSet(model, index, text);
        walk.Equal(NLIBCSzListSet(&walk.list.p, index, text.c_str()), expected, "set");
    }
}

inline void StepLook(SZLIST_WALK &walk)
{
    const SZLIST_MODEL &model = walk.model;
    const std::string text = walk.Text();
    walk.Equal(NLIBCSzListFind(walk.list.p, text.c_str()), ModelFind(model, text, false), "find");
    walk.Equal(NLIBCSzListCaseFind(walk.list.p, text.c_str()), ModelFind(model, text, true),
               "find without case");
    std::string joined;
    for (int i = 0; i < CountOf(model); i++) {
        joined += (i == 0 ? "" : ",") + TextOf(model, i);
    }
    std::vector<char> out(static_cast<size_t>(walk.decisions.Below(256)) + 1);
    const int cch = NLIBCSzListDump2Str(walk.list.p, ",", out.data(), static_cast<int>(out.size()));
    Hold(walk.defect,
         joined.size() < out.size() ? joined == out.data() && cch >= 0
                                    : cch == -1 || model.items.empty(),
         "dumped text");
}

inline void StepWhole(SZLIST_WALK &walk)
{
    constexpr int MODES[] = {SZLIST_UNSORTED, SZLIST_SORTED, SZLIST_CASE_SORTED};
    constexpr i32 SIZE_LIMIT = 65536;
    constexpr i32 MANY = 60; // lists are to become long before they are cleared, as a rule
    SZLIST_MODEL &model = walk.model;
    switch (walk.decisions.Below(5)) {
    case 0:
        NLIBCSzListCompact(walk.list.p);
        ModelCompact(model);
        break;
    case 1:
        if (CountOf(model) > MANY || walk.decisions.Below(8) == 0) {
            NLIBCSzListClear(walk.list.p);
            model.items.clear();
            model.nFree = model.nSize - 24;
        }
        break;
    case 2:
        if (model.nSize < SIZE_LIMIT) {
            walk.list.p = NLIBCSzListExpand(walk.list.p);
            ModelExpand(model);
        }
        break;
    default: {
        const int fMode = MODES[walk.decisions.Below(3)];
        NLIBCSzListSort(walk.list.p, fMode);
        ModelSort(model, fMode);
    }
    }
}

// The first thing that does not hold on a walk of these decisions; empty when everything does.
inline std::string SzListWalk(std::string_view decisions)
{
    SZLIST_WALK walk = {.decisions = {decisions}};
    while (!walk.decisions.rest.empty() && walk.defect.empty()) {
        const int dice = walk.decisions.Below(20);
        if (dice < 10) {
            StepGrow(walk);
        } else if (dice < 15) {
            StepChange(walk);
        } else if (dice < 18) {
            StepLook(walk);
        } else {
            StepWhole(walk);
        }
        const std::string defect = Compare(walk.list.p, walk.model);
        Hold(walk.defect, defect.empty(), defect.c_str());
    }
    return walk.defect;
}
