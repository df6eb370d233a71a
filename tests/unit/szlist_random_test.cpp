// SPDX-License-Identifier: MIT
//
// Thousands of random operations on a list and on a plain vector; both must tell the same after
// every one of them, down to the bytes that are free.
#include "nurocore/szlist.h"

#include "szlist_model.h"
#include "test_error.h"

#include <random>

namespace
{

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
