// SPDX-License-Identifier: MIT
#pragma once

// A walk through the operations on a table and on a std::map: both must tell the same after every
// one of them.

#include "decisions.h"
#include "test_hash.h"

#include <map>
#include <set>

struct HASH_WALK {
    DECISIONS decisions;
    TEST_HASH hash;
    std::map<std::string, std::string> pairs{};
    std::string defect{};

    std::string Text()
    {
        return decisions.Below(16) == 0 ? "" : decisions.Text("abcAB/0\xe9");
    }
    void Tells(bool fHolds, const char *szClaim)
    {
        Hold(defect, fHolds, szClaim);
    }
};

inline int ModelIndex(const std::string &text, int nSlot)
{
    u32 sum = 0;
    for (size_t i = 0; i < text.size(); i += 4) {
        u32 group = 0;
        for (size_t k = 0; k < 4; k++) {
            const char ch = i + k < text.size() ? text[i + k] : '\0';
            group = group << 8 | static_cast<unsigned char>(ch);
        }
        sum += group;
    }
    return static_cast<int>(sum % static_cast<u32>(nSlot));
}

inline void BlockTells(HASH_WALK &walk)
{
    const std::string defect = Defect(walk.hash.p);
    walk.Tells(defect.empty(), defect.c_str());
}

// From its home a key goes past slots of others to the one that is told.
inline void SlotTells(HASH_WALK &walk, const std::string &key, int index)
{
    const NLIBHASH *const pHash = walk.hash.p;
    const auto *const pSlots = reinterpret_cast<const NLIBHASH_SLOT *>(pHash + 1);
    const int nHome = ModelIndex(key, pHash->nSlot);
    walk.Tells(NLIBCHashIndex(key.c_str(), pHash->nSlot) == nHome, "the home of a key");
    for (int i = nHome; i != index; i = (i + 1) % pHash->nSlot) {
        walk.Tells(pSlots[i].pszKey != nullptr && pSlots[i].pszKey != key, "a slot of another key");
    }
    walk.Tells(pSlots[index].pszKey == key, "the slot of the key");
}

inline void StepSet(HASH_WALK &walk, const std::string &key, const std::string &value,
                    const char *szValue)
{
    const PNLIBHASH pBefore = walk.hash.p;
    const i32 nSlotBefore = pBefore->nSlot;
    const int index = NLIBCHashSet(&walk.hash.p, key.c_str(), szValue);
    const i32 nSlot = walk.hash.p->nSlot;
    walk.Tells(index >= 0 && index < nSlot, "a slot of the table");
    walk.Tells(nSlot == nSlotBefore || nSlot == nSlotBefore * 4 - 5, "its growth");
    if (walk.defect.empty()) {
        SlotTells(walk, key, index);
    }
    if (walk.hash.p != pBefore) {
        BlockTells(walk);
    }
    walk.pairs[key] = value;
}

inline void PairsTell(HASH_WALK &walk)
{
    const NLIBHASH *const pHash = walk.hash.p;
    walk.Tells(pHash->nEntry == static_cast<int>(walk.pairs.size()), "as many keys");
    walk.Tells(pHash->cbFree >= 0 && pHash->cbFree <= pHash->cbPool, "the pool's free bytes");
    for (const auto &[key, value] : walk.pairs) {
        const char *const szValue = NLIBCHashGet(pHash, key.c_str());
        walk.Tells(szValue != nullptr && szValue == value, "every key has its value");
    }
}

inline void KeysTell(HASH_WALK &walk)
{
    const ITEMS keys = KeysOf(walk.hash.p);
    const std::set<std::string> each(keys.begin(), keys.end());
    walk.Tells(each.size() == keys.size() && keys.size() == walk.pairs.size(), "each key once");
    for (const std::string &key : each) {
        walk.Tells(walk.pairs.contains(key), "no other keys");
    }
}

// The first thing that does not hold on a walk of these decisions; empty when everything does.
inline std::string HashWalk(std::string_view bytes)
{
    DECISIONS decisions = {bytes};
    const int cbPool = decisions.Below(200) * 4;
    HASH_WALK walk = {.decisions = decisions, .hash = TEST_HASH(NLIBCHashAlloc(cbPool))};
    while (!walk.decisions.rest.empty() && walk.defect.empty()) {
        const int dice = walk.decisions.Below(8);
        const std::string key = walk.Text();
        if (dice < 5) {
            const std::string value = walk.Text();
            StepSet(walk, key, value, value.c_str());
        } else if (dice == 5 && !walk.pairs.empty()) { // a text of the table's own
            const auto [source, own] = *walk.pairs.begin();
            StepSet(walk, key, own, NLIBCHashGet(walk.hash.p, source.c_str()));
        } else {
            const bool fThere = NLIBCHashGet(walk.hash.p, key.c_str()) != nullptr;
            walk.Tells(fThere == walk.pairs.contains(key), "there or not");
        }
        PairsTell(walk);
    }
    BlockTells(walk);
    KeysTell(walk);
    return walk.defect;
}
