// SPDX-License-Identifier: MIT
//
// The input is the partitioner's listing of one partition.
#include "nurostoragecore/partition_edit.h"

#include "fuzz.h"
#include "outside.h"

#include <cstdlib>
#include <vector>

namespace
{

constexpr u64 UNTOUCHED = 0x5555;

std::vector<std::string> ModelFields(std::string_view listing)
{
    std::string first;
    ForEachLine(listing, 257, [&](const std::string &line) {
        first = line;
        return false;
    });
    return Words(first, " \t");
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *pInput, size_t cbInput)
{
    const std::string_view listing = InputText(pInput, cbInput);
    OutsideClear();
    OutsideToolOutput(listing);
    u64 start = UNTOUCHED;
    u32 type = UNTOUCHED;
    const i64 nSectors = PartitionGeometryGet(3, "sda", &start, &type);

    const std::vector<std::string> fields = ModelFields(listing);
    if (fields.size() < 5) {
        Claim(nSectors == PARTITION_ABSENT, "no partition");
        Claim(start == UNTOUCHED && type == UNTOUCHED, "nothing is stored");
        return 0;
    }
    Claim(start == strtoull(fields[1].c_str(), nullptr, 10), "the start");
    Claim(nSectors == strtoll(fields[3].c_str(), nullptr, 10), "the size");
    Claim(type == static_cast<u32>(strtoul(fields[4].c_str(), nullptr, 16)), "the type");
    return 0;
}
