// SPDX-License-Identifier: MIT
//
// The input is what pvs prints of the physical volumes.
#include "nurostoragecore/lvm.h"

#include "fuzz.h"
#include "text.h"

#include <array>
#include <optional>

namespace
{

constexpr size_t PATH_SIZE = 256;

// None when there is no row, or one of fewer than four fields.
std::optional<std::string> ModelPath(std::string_view rows)
{
    std::optional<std::string> row;
    for (const std::string &line : Lines(rows, 1024)) {
        row = line.find("/dev/md2") != std::string::npos ? line : row;
    }
    const size_t group = row.has_value() ? row->find(':') : std::string::npos;
    const size_t volume = group == std::string::npos ? group : row->find(':', group + 1);
    const size_t origin = volume == std::string::npos ? volume : row->find(':', volume + 1);
    if (origin == std::string::npos) {
        return {};
    }
    const std::string path = "/dev/" + row->substr(group + 1, volume - group - 1) + "/" +
                             row->substr(volume + 1, origin - volume - 1);
    return path.substr(0, PATH_SIZE - 1);
}

} // namespace

void Fuzz(std::string_view rows)
{
    OutsideToolOutput(rows);
    std::array<char, PATH_SIZE> path = {};
    const int result = LVMGetLVPath("/dev/md2", path.data(), static_cast<int>(path.size()));
    const auto expected = ModelPath(rows);
    Claim(result == (expected.has_value() ? 0 : -1), "a row is found or not");
    Claim(result != 0 || *expected == path.data(), "the path of the row");
}
