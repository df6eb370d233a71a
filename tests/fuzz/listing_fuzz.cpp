// SPDX-License-Identifier: MIT
//
// The input is the partitioner's listing of one partition.
#include "nurostoragecore/partition_edit.h"

#include "fuzz.h"
#include "listing.h"

void Fuzz(std::string_view listing)
{
    constexpr u64 UNTOUCHED = 0x5555;
    OutsideToolOutput(listing);
    u64 start = UNTOUCHED;
    u32 type = UNTOUCHED;
    const i64 nSectors = PartitionGeometryGet(3, "sda", &start, &type);

    const LISTED expected =
        ListingRead(listing).value_or(LISTED{UNTOUCHED, PARTITION_ABSENT, UNTOUCHED});
    Claim(nSectors == expected.nSectors, "the size, or no partition");
    Claim(start == expected.start, "the start, or nothing is stored");
    Claim(type == expected.type, "the type, or nothing is stored");
}
