// SPDX-License-Identifier: MIT
#include "bar.h"

#include "inventory.h"
#include "outcome.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <string>

namespace
{

constexpr std::uint64_t BAR_WIDTH = 60;

struct LAYOUT_ROW {
    const char *szVersion;
    std::uint64_t start;
    std::uint64_t systemSize;
    std::uint64_t swapSize;
};

// In sectors.
constexpr LAYOUT_ROW LAYOUTS[] = {
    {"1", 63, 273042, 787185},           {"1", 63, 1574307, 787185},
    {"2", 63, 4980087, 1044225},         {"3", 63, 530082, 787185},
    {"5", 63, 722862, 594405},           {"6", 63, 4980087, 4192965},
    {"7", 256, 4980480, 4194304},        {"8", 2048, 4980480, 4194304},
    {"built-in", 256, 2097152, 5105569},
};

void PieceDraw(int number, std::uint64_t start, std::uint64_t nSector, std::uint64_t nDisk,
               std::string *pszBar)
{
    const std::uint64_t first = std::min(start * BAR_WIDTH / nDisk, BAR_WIDTH - 1);
    const std::uint64_t last =
        std::clamp((start + nSector) * BAR_WIDTH / nDisk, first + 1, BAR_WIDTH);
    const char digit = static_cast<char>('0' + number % 10);
    std::fill(pszBar->begin() + static_cast<std::ptrdiff_t>(first),
              pszBar->begin() + static_cast<std::ptrdiff_t>(last), digit);
}

} // namespace

std::string LayoutVersionText(const DISK &disk)
{
    constexpr size_t SYSTEM_PARTITIONS = 2;
    if (disk.partitions.size() < SYSTEM_PARTITIONS || disk.partitions[0].number != 1 ||
        disk.partitions[1].number != 2) {
        return "";
    }
    const PARTITION &system = disk.partitions[0];
    const PARTITION &swap = disk.partitions[1];
    for (const LAYOUT_ROW &row : LAYOUTS) {
        if (system.start == row.start && system.device.nSector == row.systemSize &&
            swap.start == row.start + row.systemSize && swap.device.nSector == row.swapSize) {
            return row.szVersion;
        }
    }
    return "";
}

std::string BarOf(const DISK &disk)
{
    std::string szBar(BAR_WIDTH, ' ');
    for (const PARTITION &partition : disk.partitions) {
        PieceDraw(partition.number, partition.start, partition.device.nSector,
                  std::max<std::uint64_t>(disk.device.nSector, 1), &szBar);
    }
    return szBar;
}

std::string BarOf(const DISK_OUTCOME &outcome)
{
    std::string szBar(BAR_WIDTH, ' ');
    for (const PIECE &piece : outcome.after) {
        PieceDraw(piece.number, piece.start, piece.nSector,
                  std::max<std::uint64_t>(outcome.pDisk->device.nSector, 1), &szBar);
    }
    return szBar;
}
