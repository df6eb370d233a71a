// SPDX-License-Identifier: MIT
//
// The input is what the examine command prints of a device.
#include "nurocore/text.h"
#include "nurostoragecore/raid_superblock.h"

#include "conf_model.h"
#include "outside.h"

#include <cstring>
#include <map>

namespace
{

// As many of a field's bytes as it holds with its terminator.
std::string Cut(const std::string &text, size_t cbField)
{
    return text.substr(0, cbField - 1);
}

bool ModelVersion(const std::string &value, RAID_SUPERBLOCK &expected)
{
    const size_t point = value.find('.');
    if (point == std::string::npos) {
        return false;
    }
    expected.majorVersion = NLIBCStrToI32(value.substr(0, point).c_str());
    expected.minorVersion = NLIBCStrToI32(value.substr(point + 1).c_str());
    return true;
}

void ModelUuid(const std::string &value, RAID_SUPERBLOCK &expected)
{
    const size_t remark = value.find('(');
    const std::string uuid =
        remark == std::string::npos ? value : value.substr(0, remark == 0 ? 0 : remark - 1);
    (void)strcpy(expected.szUuid, Cut(uuid, sizeof(expected.szUuid)).c_str());
}

void ModelLevel(const std::string &value, RAID_SUPERBLOCK &expected)
{
    static const std::map<std::string, u32> LEVELS = {{"raid5", 4},   {"raid1", 2}, {"raid0", 1},
                                                      {"raid10", 16}, {"raid6", 8}, {"linear", 32}};
    const auto found = LEVELS.find(value);
    expected.level = found == LEVELS.end() ? 4 : found->second;
}

bool ModelRole(const std::string &value, RAID_SUPERBLOCK &expected)
{
    constexpr std::string_view ACTIVE = "Active device ";
    if (value.starts_with("spare")) {
        expected.deviceRole = -1;
        return true;
    }
    expected.deviceRole = value.starts_with(ACTIVE)
                              ? NLIBCStrToI32(value.substr(ACTIVE.size()).c_str())
                              : expected.deviceRole;
    return value.starts_with(ACTIVE);
}

bool ModelPair(const std::string &key, const std::string &value, RAID_SUPERBLOCK &expected)
{
    if (key == "Version") {
        return ModelVersion(value, expected);
    }
    if (key == "Device Role") {
        return ModelRole(value, expected);
    }
    if (key == "Array UUID" || key == "UUID") {
        ModelUuid(value, expected);
    } else if (key == "Raid Level") {
        ModelLevel(value, expected);
    } else if (key == "Raid Devices") {
        expected.nRaidDevices = NLIBCStrToI32(value.c_str());
    } else if (key == "Events") {
        expected.events = NLIBCStrToI32(value.c_str());
    } else if (key == "Name" || key == "Preferred Minor") {
        const size_t colon = value.rfind(':');
        const std::string number = colon == std::string::npos ? value : value.substr(colon + 1);
        const std::string path = "/dev/md" + std::to_string(NLIBCStrToI32(number.c_str()));
        (void)strcpy(expected.szMdPath, path.c_str());
    }
    return true;
}

bool ModelLine(std::string line, RAID_SUPERBLOCK &expected)
{
    if (line.ends_with('\n')) {
        line.pop_back();
    }
    const size_t colon = line.find(':');
    if (colon != std::string::npos) {
        return ModelPair(ModelTrim(line.substr(0, colon)), ModelTrim(line.substr(colon + 1)),
                         expected);
    }
    if (line.starts_with("this")) {
        expected.deviceRole = NLIBCStrToI32(ModelTrim(line.substr(4)).c_str());
    }
    return true;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *pInput, size_t cbInput)
{
    const std::string_view report = InputText(pInput, cbInput);
    OutsideClear();
    OutsideToolOutput(report);
    RAID_SUPERBLOCK found = {};
    const int result = RAIDSuperblockGet("/dev/sda3", &found);

    RAID_SUPERBLOCK expected = {};
    int expectedResult = 0;
    ForEachLine(report, 1024, [&](const std::string &line) {
        expectedResult = ModelLine(line, expected) ? 1 : -1;
        return expectedResult == 1;
    });
    Claim(result == expectedResult, "the report's result");
    Claim(result != 1 || (strcmp(found.szUuid, expected.szUuid) == 0 &&
                          strcmp(found.szMdPath, expected.szMdPath) == 0),
          "the texts of the record");
    Claim(result != 1 ||
              (found.majorVersion == expected.majorVersion &&
               found.minorVersion == expected.minorVersion && found.level == expected.level &&
               found.nRaidDevices == expected.nRaidDevices &&
               found.deviceRole == expected.deviceRole && found.events == expected.events),
          "the numbers of the record");
    return 0;
}
