// SPDX-License-Identifier: MIT
//
// The input is a walk through the operations on a string list.
#include "fuzz.h"
#include "szlist_walk.h"

void Fuzz(std::string_view input)
{
    const std::string defect = SzListWalk(input.substr(0, WALK_LENGTH));
    Claim(defect.empty(), defect.c_str());
}
