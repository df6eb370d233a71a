// SPDX-License-Identifier: MIT
//
// The input is a series of operations on a table and on a std::map; both must tell the same after
// every one of them.
#include "nurocore/hash.h"

#include "fuzz.h"

#include <map>
#include <set>

namespace
{

constexpr std::string_view LETTERS = "abcAB/0\xe9";
using PAIRS = std::map<std::string, std::string>;

int ModelIndex(const std::string &text, int nSlot)
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

void BlockTells(const NLIBHASH *pHash, const PAIRS &pairs)
{
    Claim(pHash->nEntry == static_cast<int>(pairs.size()), "as many keys");
    Claim(pHash->cbFree >= 0 && pHash->cbFree <= pHash->cbPool, "the pool's free bytes");
    for (const auto &[key, value] : pairs) {
        const char *const szValue = NLIBCHashGet(pHash, key.c_str());
        Claim(szValue != nullptr && szValue == value, "every key has its value");
    }
}

void KeysTell(const NLIBHASH *pHash, const PAIRS &pairs)
{
    PNLIBSZLIST pKeys = NLIBCSzListAlloc(512);
    Claim(NLIBCHashKeyListGet(pHash, &pKeys) == static_cast<int>(pairs.size()), "the keys' count");
    std::set<std::string> keys;
    for (int i = 0; i < pKeys->nItem; i++) {
        keys.insert(NLIBCSzListGet(pKeys, i));
    }
    Claim(keys.size() == pairs.size() && pKeys->nItem == static_cast<int>(pairs.size()),
          "each key once");
    for (const std::string &key : keys) {
        Claim(pairs.contains(key), "no other keys");
    }
    NLIBCSzListFree(pKeys);
}

// From its home a key goes past slots of others to the one that is told.
void WalkTells(const NLIBHASH *pHash, const std::string &key, int index)
{
    const auto *const pSlots = reinterpret_cast<const NLIBHASH_SLOT *>(pHash + 1);
    const int nHome = ModelIndex(key, pHash->nSlot);
    Claim(NLIBCHashIndex(key.c_str(), pHash->nSlot) == nHome, "the home of a key");
    for (int i = nHome; i != index; i = (i + 1) % pHash->nSlot) {
        Claim(pSlots[i].pszKey != nullptr && pSlots[i].pszKey != key, "a slot of another key");
    }
    Claim(pSlots[index].pszKey == key, "the slot of the key");
}

void SetTells(PNLIBHASH *ppHash, const std::string &key, const std::string &value, PAIRS &pairs)
{
    const i32 nSlotBefore = (*ppHash)->nSlot;
    const int index = NLIBCHashSet(ppHash, key.c_str(), value.c_str());
    Claim(index >= 0 && index < (*ppHash)->nSlot, "a slot of the table");
    Claim((*ppHash)->nSlot == nSlotBefore || (*ppHash)->nSlot == nSlotBefore * 4 - 5, "its growth");
    WalkTells(*ppHash, key, index);
    pairs[key] = value;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *pInput, size_t cbInput)
{
    DECISIONS decisions(InputText(pInput, cbInput));
    PNLIBHASH pHash = NLIBCHashAlloc(decisions.Below(200) * 4);
    PAIRS pairs;
    while (!decisions.rest.empty()) {
        const int dice = decisions.Below(8);
        const std::string key = decisions.Text(LETTERS);
        if (dice < 5) {
            SetTells(&pHash, key, decisions.Text(LETTERS), pairs);
        } else if (dice == 5 && !pairs.empty()) { // a text of the table's own
            const std::string own = pairs.begin()->second;
            const char *const szOwn = NLIBCHashGet(pHash, pairs.begin()->first.c_str());
            Claim(NLIBCHashSet(&pHash, key.c_str(), szOwn) >= 0, "a value of the table");
            pairs[key] = own;
        } else {
            const char *const szValue = NLIBCHashGet(pHash, key.c_str());
            Claim((szValue != nullptr) == pairs.contains(key), "there or not");
        }
        BlockTells(pHash, pairs);
    }
    KeysTell(pHash, pairs);
    NLIBCHashFree(pHash);
    return 0;
}
