// SPDX-License-Identifier: MIT
//
// The input is a walk through the operations on a table.
#include "fuzz.h"
#include "hash_walk.h"

void Fuzz(std::string_view input)
{
    const std::string defect = HashWalk(input.substr(0, WALK_LENGTH));
    Claim(defect.empty(), defect.c_str());
}
