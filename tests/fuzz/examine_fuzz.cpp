// SPDX-License-Identifier: MIT
//
// The input is what the examine command prints of a device.
#include "nurostoragecore/raid_superblock.h"

#include "examine.h"
#include "fuzz.h"

void Fuzz(std::string_view report)
{
    OutsideToolOutput(report);
    RAID_SUPERBLOCK found = {};
    const int result = RAIDSuperblockGet("/dev/sda3", &found);

    const EXAMINED expected = ReportRead(report);
    Claim(result == expected.result, "the report's result");
    Claim(result != 1 || (found.szUuid == expected.uuid && found.szMdPath == expected.mdPath),
          "the texts of the record");
    Claim(result != 1 ||
              (found.majorVersion == expected.majorVersion &&
               found.minorVersion == expected.minorVersion && found.level == expected.level &&
               found.nRaidDevices == expected.nRaidDevices &&
               found.deviceRole == expected.deviceRole && found.events == expected.events),
          "the numbers of the record");
}
