// SPDX-License-Identifier: MIT
#include "outcome.h"

#include "inventory.h"
#include "run.h"
#include "text.h"

#include <algorithm>
#include <climits>
#include <cstddef>
#include <cstdint>
#include <iterator>
#include <string>

namespace
{

constexpr std::uint64_t SECTOR_SIZE = 512;
constexpr std::uint64_t SECTOR_COUNT_MAX = 0xffffffff; // of a table with 32 bits
constexpr int LAST_SYSTEM_PARTITION = 2;

struct FATE_ROW {
    FATE fate;
    const char *szText;
};

constexpr FATE_ROW FATE_TEXTS[] = {
    {FATE::ALONE, "left alone"},
    {FATE::USED, "partitions as they are"},
    {FATE::PREPARED, "blank, gets partitions"},
    {FATE::RENEWED, "system renewed, data kept"},
    {FATE::DATA_WIPED, "DATA WIPED, system kept"},
    {FATE::WIPED, "WIPED"},
};

std::string NameOf(const std::string &szPath)
{
    return szPath.substr(szPath.rfind('/') + 1);
}

bool StartsWith(const std::string &szText, const char *szPrefix)
{
    return szText.rfind(szPrefix, 0) == 0;
}

// The value of an option such as -j2048; empty when there is none.
std::string OptionOf(const WORDS &argv, const char *szName)
{
    for (const std::string &szWord : argv) {
        if (StartsWith(szWord, szName)) {
            return szWord.substr(std::string(szName).size());
        }
    }
    return "";
}

void TakenAdd(const std::string &szPath, WORDS *pTaken)
{
    if (!IsOneOf(*pTaken, szPath)) {
        pTaken->push_back(szPath);
    }
}

// --- the partitioner ---------------------------------------------------------------------------

void PiecesDelete(int first, int last, DISK_OUTCOME *pDisk)
{
    const auto isIn = [&](const PIECE &piece) {
        return piece.number >= first && piece.number <= last;
    };
    for (const PARTITION &partition : pDisk->pDisk->partitions) {
        if (partition.number >= first && partition.number <= last) {
            TakenAdd(partition.device.szPath, &pDisk->taken);
        }
    }
    pDisk->after.erase(std::remove_if(pDisk->after.begin(), pDisk->after.end(), isIn),
                       pDisk->after.end());
}

void DeleteTake(const WORDS &argv, DISK_OUTCOME *pDisk)
{
    constexpr size_t RANGE = 2;
    const WORDS range = Split(argv[RANGE], ':');
    if (range.size() == 2) {
        PiecesDelete(static_cast<int>(NumberOf(range[0])), static_cast<int>(NumberOf(range[1])),
                     pDisk);
    } else {
        PiecesDelete(1, INT_MAX, pDisk);
    }
}

const PIECE *PieceFind(const DISK_OUTCOME &disk, int number)
{
    for (const PIECE &piece : disk.after) {
        if (piece.number == number) {
            return &piece;
        }
    }
    return nullptr;
}

// A new partition begins some sectors behind the one before it.
void CreateTake(const WORDS &argv, DISK_OUTCOME *pDisk)
{
    const int number = static_cast<int>(NumberOf(OptionOf(argv, "-N")));
    if (PieceFind(*pDisk, number) != nullptr) {
        return; // it is refused, and what is there stays
    }
    const PIECE *const pBefore = PieceFind(*pDisk, number - 1);
    const std::uint64_t start = (pBefore == nullptr ? 0 : pBefore->start + pBefore->nSector) +
                                NumberOf(OptionOf(argv, "-j"));
    const std::uint64_t end = std::min(pDisk->pDisk->device.nSector, SECTOR_COUNT_MAX);
    const std::string szSize = OptionOf(argv, "-z");
    const std::uint64_t rest = start < end ? end - start : 0;
    const std::uint64_t nSector = szSize == "-1" ? rest : NumberOf(szSize);
    if (nSector == 0 || nSector > rest) {
        pDisk->misfits.push_back({.number = number, .start = start});
        return;
    }
    pDisk->after.push_back({.number = number, .start = start, .nSector = nSector, .fKept = false});
    std::sort(pDisk->after.begin(), pDisk->after.end(),
              [](const PIECE &a, const PIECE &b) { return a.start < b.start; });
}

void PartitionerTake(const WORDS &argv, DISK_OUTCOME *pDisk)
{
    constexpr size_t DELETE_COUNT = 4;
    if (argv.size() == DELETE_COUNT && argv[1] == "--fast-delete") {
        DeleteTake(argv, pDisk);
    } else if (argv.size() > 2 && argv[1] == "-M1") {
        // With nothing to keep, the disk gets a clean table and loses what lay on it.
        pDisk->fSigned = pDisk->fSigned || pDisk->after.empty();
    } else if (argv.size() > 2 && StartsWith(argv[1], "-N")) {
        CreateTake(argv, pDisk);
    }
}

// --- all programs ------------------------------------------------------------------------------

// Whether a path is that of a partition of this disk, be it there or only being made.
bool IsPartitionOf(const std::string &szPath, const std::string &szDisk)
{
    const bool fDigit = szDisk.back() >= '0' && szDisk.back() <= '9';
    const std::string szStem = szDisk + (fDigit ? "p" : "");
    return szPath.size() > szStem.size() && StartsWith(szPath, szStem.c_str()) &&
           szPath.find_first_not_of("0123456789", szStem.size()) == std::string::npos;
}

DISK_OUTCOME *DiskOf(const std::string &szPath, const INVENTORY &inventory, OUTCOME *pOutcome)
{
    const DISK *const pDisk = InventoryDiskOf(inventory, szPath);
    for (DISK_OUTCOME &disk : pOutcome->disks) {
        if (disk.pDisk == pDisk || IsPartitionOf(szPath, disk.pDisk->device.szPath)) {
            return &disk;
        }
    }
    return nullptr;
}

// What a partition held is overwritten by an array, unless the partition has just been made.
void MemberTake(const std::string &szPath, const INVENTORY &inventory, OUTCOME *pOutcome)
{
    DISK_OUTCOME *const pDisk = DiskOf(szPath, inventory, pOutcome);
    if (pDisk != nullptr && InventoryFind(inventory, szPath) != nullptr) {
        TakenAdd(szPath, &pDisk->taken);
    }
}

void MdadmTake(const WORDS &argv, const INVENTORY &inventory, OUTCOME *pOutcome)
{
    if (argv.size() > 2 && argv[1] == "-S") {
        pOutcome->stopped.push_back(argv[2]);
        return;
    }
    if (argv.size() > 2 && (argv[1] == "-C" || argv[1] == "--zero-superblock")) {
        for (size_t i = argv[1] == "-C" ? 3 : 2; i < argv.size(); i++) {
            if (StartsWith(argv[i], "/dev/")) {
                MemberTake(argv[i], inventory, pOutcome);
            }
        }
    }
}

void GroupTake(const WORDS &argv, const INVENTORY &, OUTCOME *pOutcome)
{
    if (argv.size() > 2 && !NameOf(argv.back()).empty()) {
        pOutcome->groups.push_back(NameOf(argv.back()));
    }
}

void LabelTake(const WORDS &argv, const INVENTORY &, OUTCOME *pOutcome)
{
    pOutcome->taken.push_back(argv.back());
}

void DiskTake(const WORDS &argv, const INVENTORY &inventory, OUTCOME *pOutcome)
{
    DISK_OUTCOME *const pDisk = DiskOf(argv.back(), inventory, pOutcome);
    if (pDisk != nullptr) {
        PartitionerTake(argv, pDisk);
    }
}

struct PROGRAM_ROW {
    const char *szName;
    void (*pTake)(const WORDS &argv, const INVENTORY &inventory, OUTCOME *pOutcome);
};

constexpr PROGRAM_ROW PROGRAM_ROWS[] = {
    {"sfdisk", DiskTake},
    {"mdadm", MdadmTake},
    {"vgremove", GroupTake},
    {"pvremove", LabelTake},
};

void CommandTake(const COMMAND &command, const INVENTORY &inventory, OUTCOME *pOutcome)
{
    for (const std::string &szWord : command.argv) {
        DISK_OUTCOME *const pDisk =
            StartsWith(szWord, "/dev/") ? DiskOf(szWord, inventory, pOutcome) : nullptr;
        if (pDisk != nullptr) {
            pDisk->fAsked = true;
            pDisk->fate = command.fQuestion ? pDisk->fate : FATE::USED;
        }
    }
    for (const PROGRAM_ROW &row : PROGRAM_ROWS) {
        if (!command.fQuestion && NameOf(command.argv[0]) == row.szName) {
            row.pTake(command.argv, inventory, pOutcome);
        }
    }
}

// --- what becomes of a disk --------------------------------------------------------------------

DISK_OUTCOME DiskBegin(const DISK &disk)
{
    DISK_OUTCOME outcome = {.pDisk = &disk,
                            .fate = FATE::ALONE,
                            .after = {},
                            .taken = {},
                            .misfits = {},
                            .fAsked = false,
                            .fSigned = false};
    for (const PARTITION &partition : disk.partitions) {
        outcome.after.push_back({.number = partition.number,
                                 .start = partition.start,
                                 .nSector = partition.device.nSector,
                                 .fKept = true});
    }
    return outcome;
}

FATE FateOf(const DISK_OUTCOME &disk)
{
    const auto &before = disk.pDisk->partitions;
    const auto nKept = std::count_if(disk.after.begin(), disk.after.end(),
                                     [](const PIECE &piece) { return piece.fKept; });
    const bool fMade = static_cast<size_t>(nKept) < disk.after.size();
    if (disk.fate == FATE::ALONE) {
        return FATE::ALONE;
    }
    if (before.empty()) {
        const bool fHeld = disk.fSigned && !disk.pDisk->device.signatures.empty();
        return fHeld ? FATE::WIPED : fMade || disk.fSigned ? FATE::PREPARED : FATE::USED;
    }
    if (static_cast<size_t>(nKept) == before.size()) {
        return FATE::USED;
    }
    if (nKept == 0) {
        return FATE::WIPED;
    }
    const bool fDataGone =
        std::any_of(before.begin(), before.end(), [&](const PARTITION &partition) {
            const PIECE *const pPiece = PieceFind(disk, partition.number);
            return partition.number > LAST_SYSTEM_PARTITION &&
                   (pPiece == nullptr || !pPiece->fKept);
        });
    return fDataGone ? FATE::DATA_WIPED : FATE::RENEWED;
}

// --- what is lost ------------------------------------------------------------------------------

bool IsTaken(const OUTCOME &outcome, const std::string &szName)
{
    return IsOneOf(outcome.taken, "/dev/" + szName);
}

// How many members an array can lose and still have its data.
std::uint64_t LossBorne(const ARRAY &array)
{
    if (array.szLevel == "raid1") {
        return array.nSlot > 0 ? array.nSlot - 1 : 0;
    }
    if (array.szLevel == "raid10") {
        return 1;
    }
    return array.szLevel == "raid4" || array.szLevel == "raid5" ? 1
           : array.szLevel == "raid6"                           ? 2
                                                                : 0;
}

void FileSystemLose(const DEVICE &device, OUTCOME *pOutcome)
{
    for (const SIGNATURE &signature : device.signatures) {
        if (signature.fTable || signature.szType == "linux_raid_member" ||
            signature.szType == "LVM2_member") {
            continue;
        }
        const std::string szLabel =
            signature.szLabel.empty() ? "" : " \"" + signature.szLabel + "\"";
        pOutcome->losses.push_back({.szText = signature.szType + szLabel + " on " + device.szPath +
                                              ", " + SizeText(device.nSector * SECTOR_SIZE),
                                    .mounts = device.mounts});
    }
}

void ArrayLose(const ARRAY &array, OUTCOME *pOutcome)
{
    WORDS gone;
    std::copy_if(array.members.begin(), array.members.end(), std::back_inserter(gone),
                 [&](const std::string &szName) { return IsTaken(*pOutcome, szName); });
    if (gone.empty()) {
        return;
    }
    const std::string szArray =
        array.device.szPath.empty() ? "an array " + array.szUuid : array.device.szPath;
    const bool fLost = gone.size() + array.nMissing > LossBorne(array);
    pOutcome->losses.push_back(
        {.szText = Format(
             "array %s, %s on %s%s: %s %zu of %zu members", szArray.c_str(), array.szLevel.c_str(),
             Join(array.members, ", ").c_str(), array.fRunning ? "" : ", not assembled",
             fLost ? "lost with" : "would run on without", gone.size(), array.members.size()),
         .mounts = array.device.mounts});
    if (fLost && !array.device.szPath.empty()) {
        TakenAdd(array.device.szPath, &pOutcome->taken);
        FileSystemLose(array.device, pOutcome);
    }
}

void GroupLose(const GROUP &group, OUTCOME *pOutcome)
{
    const bool fDevice =
        std::any_of(group.devices.begin(), group.devices.end(),
                    [&](const std::string &szPath) { return IsOneOf(pOutcome->taken, szPath); });
    if (!fDevice && !IsOneOf(pOutcome->groups, group.szName)) {
        return;
    }
    if (!IsOneOf(pOutcome->groups, group.szName)) {
        pOutcome->groups.push_back(group.szName);
    }
    WORDS names;
    for (const VOLUME &volume : group.volumes) {
        names.push_back(volume.szName);
    }
    pOutcome->losses.push_back(
        {.szText = "group " + group.szName + " on " + Join(group.devices, ", ") +
                   ", volumes: " + (names.empty() ? "none" : Join(names, ", ")),
         .mounts = {}});
    for (const VOLUME &volume : group.volumes) {
        FileSystemLose(volume.device, pOutcome);
    }
}

void LossesFind(const INVENTORY &inventory, OUTCOME *pOutcome)
{
    for (const DISK_OUTCOME &disk : pOutcome->disks) {
        for (const std::string &szPath : disk.taken) {
            TakenAdd(szPath, &pOutcome->taken);
        }
        if (disk.fSigned) {
            TakenAdd(disk.pDisk->device.szPath, &pOutcome->taken);
        }
    }
    for (const std::string &szPath : WORDS(pOutcome->taken)) {
        const DEVICE *const pDevice = InventoryFind(inventory, szPath);
        if (pDevice != nullptr && InventoryDiskOf(inventory, szPath) != nullptr) {
            FileSystemLose(*pDevice, pOutcome);
        }
    }
    for (const ARRAY &array : inventory.arrays) {
        ArrayLose(array, pOutcome);
    }
    for (const GROUP &group : inventory.groups) {
        GroupLose(group, pOutcome);
    }
}

} // namespace

const char *FateText(FATE fate)
{
    for (const FATE_ROW &row : FATE_TEXTS) {
        if (row.fate == fate) {
            return row.szText;
        }
    }
    return "";
}

OUTCOME OutcomeOf(const INVENTORY &inventory, const RUN &run)
{
    OUTCOME outcome;
    for (const DISK &disk : inventory.disks) {
        outcome.disks.push_back(DiskBegin(disk));
    }
    for (const COMMAND &command : run.commands) {
        CommandTake(command, inventory, &outcome);
    }
    for (DISK_OUTCOME &disk : outcome.disks) {
        disk.fate = FateOf(disk);
    }
    LossesFind(inventory, &outcome);
    return outcome;
}
