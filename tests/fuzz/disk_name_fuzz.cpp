// SPDX-License-Identifier: MIT
//
// The first byte is the size of the buffer that a disk's name is to go to, the rest a name or a
// path.
#include "hwcontrol/disk_name.h"

#include "disk_name.h"
#include "fuzz.h"

#include <climits>
#include <cstring>

namespace
{

constexpr int PART_NUMBERS[] = {-1, 0, 1, 3, INT_MAX};

// The rule's behaviour is not defined for numbers that do not fit.
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
    const DISK_AND_NUMBER expected = PartitionNumber(name, cbDisk);
    Claim(expected.disk == disk.data(), "the disk's name");
    Claim(expected.number == number, "the partition's number");
}

void RemoveTells(const std::string &name, size_t cbDisk)
{
    std::vector<char> disk(cbDisk, '#');
    const int result = DiskPartitionNumRemove(name.c_str(), disk.data(), static_cast<int>(cbDisk));
    Claim(result == (cbDisk < name.size() + 1 ? -1 : 0), "it fits or not");
    Claim(result != 0 || WithoutPartitionNumber(name) == disk.data(),
          "the path without its number");
}

void PartitionTells(const std::string &path, int partNum, size_t cbOut)
{
    std::vector<char> out(cbOut, '#');
    const int result = DiskDevicePartitionNameGet(path.c_str(), partNum, out.data(), cbOut);
    const std::string name = PartitionName(path, partNum);
    Claim(result == (partNum <= 0 || name.starts_with("nuroboot") ? -1 : 0), "a name or none");
    Claim(result != 0 || name.substr(0, cbOut - 1) == out.data(), "the partition's name");

    Claim(DiskDevicePartitionPathGet(path.c_str(), partNum, out.data(), cbOut) == result,
          "a path or none");
    Claim(result != 0 || PartitionPath(path, partNum).substr(0, cbOut - 1) == out.data(),
          "the partition's path");
}

} // namespace

void Fuzz(std::string_view input)
{
    if (input.empty()) {
        return;
    }
    const size_t cbBuffer = static_cast<unsigned char>(input[0]) % 130U + 1U;
    const std::string name = CString(input.substr(1));
    NumberTells(name, cbBuffer);
    RemoveTells(name, cbBuffer);
    for (const int partNum : PART_NUMBERS) {
        PartitionTells(name, partNum, cbBuffer);
    }
    Claim(DiskIndexGet(name.c_str()) == DiskIndex(name), "the disk's index");
}
