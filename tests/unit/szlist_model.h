// SPDX-License-Identifier: MIT
#pragma once

// A string list once more, as a plain vector: what must be told after every operation.

#include "test_szlist.h"

#include <algorithm>
#include <cctype>
#include <optional>
#include <string>
#include <strings.h>
#include <vector>

struct MODEL {
    std::vector<std::optional<std::string>> items; // without a value: an empty slot
    i32 nSize = 512;
    i32 nFree = 488;
    int fMode = 0;
};

inline i32 CountOf(const MODEL &model)
{
    return static_cast<i32>(model.items.size());
}

inline i32 BytesOf(const std::string &text)
{
    return static_cast<i32>(text.size()) + 1;
}

inline std::string TextOf(const MODEL &model, int index)
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

inline int ModelSearch(const MODEL &model, const std::string &key)
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

inline void ModelExpand(MODEL &model)
{
    model.nSize *= 2;
    model.nFree = model.nSize - 24 - 4 * CountOf(model);
    for (const auto &item : model.items) {
        model.nFree -= item.has_value() ? BytesOf(*item) : 0;
    }
}

inline int ModelInsert(MODEL &model, int index, const std::string &text)
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

inline void ModelOrder(MODEL &model, int fMode)
{
    std::stable_sort(model.items.begin(), model.items.end(), [&](const auto &a, const auto &b) {
        return Difference(fMode, a.value_or(""), b.value_or("")) < 0;
    });
}

inline void ModelCompact(MODEL &model)
{
    const i32 nBefore = CountOf(model);
    std::erase(model.items, std::nullopt);
    model.nFree += 4 * (nBefore - CountOf(model));
}

inline void ModelSort(MODEL &model, int fMode)
{
    if (model.fMode == SZLIST_UNSORTED) {
        ModelCompact(model);
        if (fMode != SZLIST_UNSORTED) {
            ModelOrder(model, fMode);
        }
    }
    model.fMode = fMode;
}

inline int ModelFind(const MODEL &model, const std::string &key, bool fNoCase)
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

inline int ModelSet(MODEL &model, int index, const std::string &text)
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

inline std::string Compare(const NLIBSZLIST *pList, const MODEL &model)
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
