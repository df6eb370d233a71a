// SPDX-License-Identifier: MIT
//
// The input is a walk through the operations on a table.
#include "fuzz.h"
#include "hash_walk.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *pInput, size_t cbInput)
{
    ClaimNoDefect(HashWalk(InputText(pInput, cbInput).substr(0, WALK_LENGTH)));
    return 0;
}
