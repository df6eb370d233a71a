// SPDX-License-Identifier: MIT
//
// The input is a series of operations on a list and on a plain vector; both must tell the same
// after every one of them, down to the bytes that are free.
#include "fuzz.h"
#include "szlist_model.h"
#include "test_szlist.h"

namespace
{

constexpr std::string_view LETTERS = "abcdeABCDE_";
constexpr i32 SIZE_LIMIT = 65536;

void Grow(DECISIONS &decisions, TEST_LIST &list, MODEL &model)
{
    const std::string text = decisions.Text(LETTERS);
    const int nItem = CountOf(model);
    switch (decisions.Below(4)) {
    case 0:
        Claim(NLIBCSzListPush(&list.p, text.c_str()) == ModelInsert(model, nItem, text), "push");
        break;
    case 1:
        Claim(NLIBCSzListPushHead(&list.p, text.c_str()) == ModelInsert(model, 0, text), "head");
        break;
    case 2: {
        const int index = decisions.Below(nItem + 6);
        Claim(NLIBCSzListInsert(&list.p, index, text.c_str()) == ModelInsert(model, index, text),
              "insert");
        break;
    }
    default:
        if (nItem > 0) { // a string of the list's own
            const int index = decisions.Below(nItem);
            const std::string own = TextOf(model, index);
            Claim(own.empty() || NLIBCSzListPush(&list.p, NLIBCSzListGet(list.p, index)) ==
                                     ModelInsert(model, nItem, own),
                  "push of an item");
        }
    }
}

void Change(DECISIONS &decisions, TEST_LIST &list, MODEL &model)
{
    if (model.items.empty()) {
        Claim(NLIBCSzListRemove(list.p, 0) == nullptr, "nothing to remove");
        return;
    }
    const int index = decisions.Below(CountOf(model));
    if (decisions.Below(2) == 0) {
        Claim(NLIBCSzListRemove(list.p, index) == TextOf(model, index), "remove");
        model.items.erase(model.items.begin() + index);
        model.nFree += 4;
        return;
    }
    const std::string text = decisions.Text(LETTERS);
    if (BytesOf(text) <= model.nFree) {
        const int expected = ModelSet(model, index, text);
        Claim(NLIBCSzListSet(&list.p, index, text.c_str()) == expected, "set");
    }
}

void Look(DECISIONS &decisions, const TEST_LIST &list, const MODEL &model)
{
    const std::string text = decisions.Text(LETTERS);
    Claim(NLIBCSzListFind(list.p, text.c_str()) == ModelFind(model, text, false), "find");
    Claim(NLIBCSzListCaseFind(list.p, text.c_str()) == ModelFind(model, text, true), "case-find");
    std::string joined;
    for (int i = 0; i < CountOf(model); i++) {
        joined += (i == 0 ? "" : ",") + TextOf(model, i);
    }
    std::vector<char> out(static_cast<size_t>(decisions.Below(256)) + 1);
    const int cch = NLIBCSzListDump2Str(list.p, ",", out.data(), static_cast<int>(out.size()));
    Claim(joined.size() < out.size() ? joined == out.data() && cch >= 0
                                     : cch == -1 || model.items.empty(),
          "dumped text");
}

void Whole(DECISIONS &decisions, TEST_LIST &list, MODEL &model)
{
    constexpr int MODES[] = {SZLIST_UNSORTED, SZLIST_SORTED, SZLIST_CASE_SORTED};
    switch (decisions.Below(5)) {
    case 0:
        NLIBCSzListCompact(list.p);
        ModelCompact(model);
        break;
    case 1:
        NLIBCSzListClear(list.p);
        model.items.clear();
        model.nFree = model.nSize - 24;
        break;
    case 2:
        list.p = NLIBCSzListExpand(list.p);
        ModelExpand(model);
        break;
    default: {
        const int fMode = MODES[decisions.Below(3)];
        NLIBCSzListSort(list.p, fMode);
        ModelSort(model, fMode);
    }
    }
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *pInput, size_t cbInput)
{
    DECISIONS decisions(InputText(pInput, cbInput));
    TEST_LIST list(512);
    MODEL model;
    while (!decisions.rest.empty() && model.nSize < SIZE_LIMIT) {
        const int dice = decisions.Below(20);
        if (dice < 10) {
            Grow(decisions, list, model);
        } else if (dice < 15) {
            Change(decisions, list, model);
        } else if (dice < 18) {
            Look(decisions, list, model);
        } else {
            Whole(decisions, list, model);
        }
        const std::string defect = Compare(list.p, model);
        Claim(defect.empty(), defect.c_str());
    }
    return 0;
}
