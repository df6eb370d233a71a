// SPDX-License-Identifier: MIT
//
// Thousands of random operations on a list and on a plain vector.
#include "szlist_walk.h"

#include <gtest/gtest.h>

namespace
{

TEST(SzListRandom, TellsTheSameAsAVector)
{
    std::mt19937 random(20080516);
    for (int nRound = 0; nRound < 20; nRound++) {
        ASSERT_EQ(SzListWalk(RandomBytes(random, 2600)), "") << "round " << nRound;
    }
}

} // namespace
