// SPDX-License-Identifier: MIT
//
// The first byte is the size of the buffer that a disk's name is to go to, the rest a name or a
// path. What is expected of it is read with scanf.
#include "hwcontrol/disk_name.h"

#include "fuzz.h"

#include <algorithm>
#include <climits>
#include <cstring>
#include <vector>

namespace
{

constexpr int PART_NUMBERS[] = {-1, 0, 1, 3, INT_MAX};

bool IsMmc(const std::string &name)
{
    return name.find("mmcblk") != std::string::npos;
}

// scanf's behaviour is not defined for numbers that do not fit.
bool HasLongNumber(const std::string &name)
{
    int nDigits = 0;
    for (const char ch : name) {
        nDigits = ch >= '0' && ch <= '9' ? nDigits + 1 : 0;
        if (nDigits > 9) {
            return true;
        }
    }
    return false;
}

void NumberTells(const std::string &name, size_t cbDisk)
{
    std::vector<char> disk(cbDisk, '#');
    const int number = DiskPartitionNumGet(name.c_str(), disk.data(), static_cast<int>(cbDisk));
    Claim(memchr(disk.data(), '\0', cbDisk) != nullptr, "the disk's name has an end");
    if (cbDisk < 2 || HasLongNumber(name)) {
        return;
    }
    std::vector<char> expected(cbDisk, '\0');
    int expectedNumber = -1;
    char szFormat[32];
    (void)snprintf(szFormat, sizeof(szFormat), IsMmc(name) ? "%%%zu[^p]p%%d" : "%%%zu[^1-9]%%d",
                   cbDisk - 1);
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
    const int nScanned = sscanf(name.c_str(), szFormat, expected.data(), &expectedNumber);
#pragma GCC diagnostic pop
    Claim(disk.data() == std::string(expected.data()), "the disk's name");
    if (nScanned < 0) {
        expectedNumber = -1;
    } else if (expected.data() == name) {
        expectedNumber = 0;
    }
    Claim(number == expectedNumber, "the partition's number");
}

void RemoveTells(const std::string &name, size_t cbDisk)
{
    std::vector<char> disk(cbDisk, '#');
    const int result = DiskPartitionNumRemove(name.c_str(), disk.data(), static_cast<int>(cbDisk));
    Claim(result == (cbDisk < name.size() + 1 ? -1 : 0), "it fits or not");
    if (result != 0) {
        return;
    }
    std::string expected = name;
    const size_t last = name.rfind('p');
    if (!IsMmc(name)) {
        expected.resize(std::min(name.find_first_of("0123456789"), name.size()));
    } else if (last != std::string::npos && name[last + 1] >= '0' && name[last + 1] <= '9') {
        expected.resize(last);
    }
    Claim(expected == disk.data(), "the path without its number");
}

void PartitionTells(const std::string &path, int partNum, size_t cbOut)
{
    std::vector<char> out(cbOut, '#');
    std::string disk =
        path.starts_with("/dev") ? path.substr(std::min<size_t>(5, path.size())) : path;
    disk = disk.substr(0, 31);
    const int result = DiskDevicePartitionNameGet(path.c_str(), partNum, out.data(), cbOut);
    Claim(result == (partNum <= 0 || disk.starts_with("nuroboot") ? -1 : 0), "a name or none");
    const std::string name = disk + (IsMmc(disk) ? "p" : "") + std::to_string(partNum);
    Claim(result != 0 || name.substr(0, cbOut - 1) == out.data(), "the partition's name");

    Claim(DiskDevicePartitionPathGet(path.c_str(), partNum, out.data(), cbOut) == result,
          "a path or none");
    Claim(result != 0 || ("/dev/" + name.substr(0, 31)).substr(0, cbOut - 1) == out.data(),
          "the partition's path");
}

void IndexTells(const std::string &path)
{
    std::string_view name(path);
    name.remove_prefix(name.starts_with("/dev/") ? 5 : 0);
    name.remove_prefix(name.starts_with("sd") ? 2 : 0);
    u32 expected = ~0U;
    for (size_t i = 0; i < name.size() && name[i] >= 'a' && name[i] <= 'z'; i++) {
        expected = (expected + 1) * 26 + static_cast<u32>(name[i] - 'a');
    }
    Claim(static_cast<u32>(DiskIndexGet(path.c_str())) == expected, "the disk's index");
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *pInput, size_t cbInput)
{
    if (cbInput == 0) {
        return 0;
    }
    const size_t cbBuffer = pInput[0] % 130U + 1U;
    const std::string name = CString(InputText(pInput + 1, cbInput - 1));
    NumberTells(name, cbBuffer);
    RemoveTells(name, cbBuffer);
    for (const int partNum : PART_NUMBERS) {
        PartitionTells(name, partNum, cbBuffer);
    }
    IndexTells(name);
    return 0;
}
