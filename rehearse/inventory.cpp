// SPDX-License-Identifier: MIT
#include "inventory.h"

#include "host.h"
#include "run.h"
#include "text.h"

#include <algorithm>
#include <blkid/blkid.h>
#include <cctype>
#include <cstddef>
#include <cstdint>
#include <iterator>
#include <memory>
#include <string>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <type_traits>
#include <vector>

namespace
{

constexpr char SYS_BLOCK[] = "/sys/block/";
constexpr char RAID_MEMBER[] = "linux_raid_member";

// What is no disk of its own.
constexpr const char *OTHER_NAMES[] = {"dm-", "fd", "loop", "md", "nbd", "ram", "sr", "zram"};

struct PROBE_DELETER {
    void operator()(blkid_probe pProbe) const
    {
        blkid_free_probe(pProbe);
    }
};

using PROBE_OWNER = std::unique_ptr<std::remove_pointer_t<blkid_probe>, PROBE_DELETER>;

std::string ProbedValue(blkid_probe pProbe, const char *szName)
{
    const char *szValue = nullptr;
    return blkid_probe_lookup_value(pProbe, szName, &szValue, nullptr) == 0 ? szValue : "";
}

std::vector<SIGNATURE> SignaturesProbe(const std::string &szPath, bool *pfReadable)
{
    std::vector<SIGNATURE> signatures;
    const PROBE_OWNER pProbe(blkid_new_probe_from_filename(szPath.c_str()));
    *pfReadable = pProbe != nullptr;
    if (pProbe == nullptr) {
        return signatures;
    }
    (void)blkid_probe_enable_superblocks(pProbe.get(), 1);
    (void)blkid_probe_set_superblocks_flags(pProbe.get(), BLKID_SUBLKS_TYPE | BLKID_SUBLKS_LABEL);
    (void)blkid_probe_enable_partitions(pProbe.get(), 1);
    int result = 0;
    while ((result = blkid_do_probe(pProbe.get())) == 0) {
        const std::string szTable = ProbedValue(pProbe.get(), "PTTYPE");
        signatures.push_back(
            {.szType = szTable.empty() ? ProbedValue(pProbe.get(), "TYPE") : szTable,
             .szLabel = ProbedValue(pProbe.get(), "LABEL"),
             .fTable = !szTable.empty()});
    }
    *pfReadable = result >= 0;
    return signatures;
}

bool HasSignature(const DEVICE &device, const char *szType)
{
    return std::any_of(device.signatures.begin(), device.signatures.end(),
                       [&](const SIGNATURE &found) { return found.szType == szType; });
}

DEVICE DeviceRead(const std::string &szName, const std::string &szFolder, const HOST &host)
{
    DEVICE device;
    struct stat info = {};
    device.szName = szName;
    device.szPath = "/dev/" + szName;
    device.nSector = NumberOf(AttributeRead(szFolder + "/size"));
    device.holders = FolderList(szFolder + "/holders");
    device.signatures = SignaturesProbe(device.szPath, &device.fReadable);
    if (HasSignature(device, RAID_MEMBER)) {
        device.superblock = SuperblockParse(RunQuestion({"/sbin/mdadm", "-E", device.szPath}));
    }
    if (stat(device.szPath.c_str(), &info) == 0 && S_ISBLK(info.st_mode)) {
        for (const MOUNT &mount : host.mounts) {
            if (mount.device == info.st_rdev) {
                device.mounts.push_back(mount.szPath);
            }
        }
        device.fSwap =
            std::find(host.swaps.begin(), host.swaps.end(), info.st_rdev) != host.swaps.end();
    }
    return device;
}

// --- disks -------------------------------------------------------------------------------------

bool IsDiskName(const std::string &szName)
{
    return std::none_of(std::begin(OTHER_NAMES), std::end(OTHER_NAMES), [&](const char *szOther) {
        return szName.compare(0, std::string(szOther).size(), szOther) == 0;
    });
}

// The number behind the disk's name; 0 when the folder is no partition.
int PartitionNumber(const std::string &szDisk, const std::string &szName)
{
    if (szName.compare(0, szDisk.size(), szDisk) != 0) {
        return 0;
    }
    std::string szNumber = szName.substr(szDisk.size());
    if (!szNumber.empty() && szNumber[0] == 'p') {
        szNumber.erase(0, 1);
    }
    return static_cast<int>(NumberOf(szNumber));
}

// A page of vital product data has four bytes in front of the text.
std::string SerialRead(const std::string &szDevice)
{
    constexpr size_t HEAD_SIZE = 4;
    const std::string szPage = FileRead(szDevice + "/vpd_pg80").value_or("");
    return szPage.size() > HEAD_SIZE ? Trimmed(szPage.substr(HEAD_SIZE))
                                     : AttributeRead(szDevice + "/serial");
}

DISK DiskRead(const std::string &szName, const HOST &host)
{
    const std::string szFolder = SYS_BLOCK + szName;
    DISK disk;
    disk.device = DeviceRead(szName, szFolder, host);
    disk.szModel = AttributeRead(szFolder + "/device/model");
    disk.szSerial = SerialRead(szFolder + "/device");
    disk.fReadOnly = AttributeRead(szFolder + "/ro") == "1";
    for (const std::string &szEntry : FolderList(szFolder)) {
        const int number = PartitionNumber(szName, szEntry);
        const std::string szStart = AttributeRead(szFolder + "/" + szEntry + "/start");
        if (number > 0 && !szStart.empty()) {
            disk.partitions.push_back(
                {.number = number,
                 .start = NumberOf(szStart),
                 .device = DeviceRead(szEntry, szFolder + "/" + szEntry, host)});
        }
    }
    std::sort(disk.partitions.begin(), disk.partitions.end(),
              [](const PARTITION &a, const PARTITION &b) { return a.number < b.number; });
    return disk;
}

// sda before sdaa, and both before sdb: by length first.
bool IsBefore(const std::string &szA, const std::string &szB)
{
    return szA.size() != szB.size() ? szA.size() < szB.size() : szA < szB;
}

std::vector<DISK> DisksRead(const HOST &host)
{
    std::vector<DISK> disks;
    for (const std::string &szName : FolderList(SYS_BLOCK)) {
        if (IsDiskName(szName) && AttributeRead(SYS_BLOCK + szName + "/size") != "0") {
            disks.push_back(DiskRead(szName, host));
        }
    }
    std::sort(disks.begin(), disks.end(), [](const DISK &a, const DISK &b) {
        return IsBefore(a.device.szName, b.device.szName);
    });
    return disks;
}

// --- arrays ------------------------------------------------------------------------------------

ARRAY RunningArrayRead(const std::string &szName, const HOST &host)
{
    constexpr char MEMBER[] = "dev-";
    const std::string szFolder = SYS_BLOCK + szName;
    std::uint64_t nWhole = 0;
    ARRAY array;
    array.device = DeviceRead(szName, szFolder, host);
    array.fRunning = true;
    array.szLevel = AttributeRead(szFolder + "/md/level");
    array.nSlot = NumberOf(AttributeRead(szFolder + "/md/raid_disks"));
    for (const std::string &szEntry : FolderList(szFolder + "/md")) {
        if (szEntry.compare(0, sizeof(MEMBER) - 1, MEMBER) == 0) {
            array.members.push_back(szEntry.substr(sizeof(MEMBER) - 1));
            const std::string szState = AttributeRead(szFolder + "/md/" + szEntry + "/state");
            nWhole += szState.find("faulty") == std::string::npos ? 1U : 0U;
        }
    }
    // A member that is being rebuilt is there; "degraded" would count it as missing.
    array.nMissing = array.nSlot > nWhole ? array.nSlot - nWhole : 0;
    return array;
}

bool IsMember(const ARRAY &array, const DEVICE &device)
{
    return (!array.szUuid.empty() && array.szUuid == device.superblock.szUuid) ||
           IsOneOf(array.members, device.szName);
}

// A member that no running array lists belongs to the array of its superblock.
void MemberAdd(const DEVICE &device, std::vector<ARRAY> *pArrays)
{
    if (!device.superblock.fFound) {
        return;
    }
    for (ARRAY &array : *pArrays) {
        if (IsMember(array, device)) {
            array.szUuid = device.superblock.szUuid;
            if (!IsOneOf(array.members, device.szName)) {
                array.members.push_back(device.szName);
            }
            return;
        }
    }
    ARRAY array;
    array.device.szName = device.superblock.szMd;
    array.device.szPath = array.device.szName.empty() ? "" : "/dev/" + array.device.szName;
    array.szLevel = device.superblock.szLevel;
    array.szUuid = device.superblock.szUuid;
    array.nSlot = device.superblock.nDevices;
    array.members.push_back(device.szName);
    pArrays->push_back(array);
}

std::vector<ARRAY> ArraysRead(const std::vector<DISK> &disks, const HOST &host)
{
    std::vector<ARRAY> arrays;
    for (const std::string &szName : FolderList(SYS_BLOCK)) {
        if (szName.compare(0, 2, "md") == 0 &&
            !AttributeRead(SYS_BLOCK + szName + "/md/array_state").empty()) {
            arrays.push_back(RunningArrayRead(szName, host));
        }
    }
    for (const DISK &disk : disks) {
        MemberAdd(disk.device, &arrays);
        for (const PARTITION &partition : disk.partitions) {
            MemberAdd(partition.device, &arrays);
        }
    }
    for (ARRAY &array : arrays) {
        if (!array.fRunning && array.nSlot > array.members.size()) {
            array.nMissing = array.nSlot - array.members.size();
        }
    }
    return arrays;
}

// --- LVM ---------------------------------------------------------------------------------------

// Fields of a row of pvs.
enum { ROW_DEVICE, ROW_GROUP, ROW_VOLUME, ROW_COUNT };

VOLUME VolumeRead(const std::string &szGroup, const std::string &szVolume, const HOST &host)
{
    VOLUME volume;
    volume.szName = szVolume;
    const std::string szPath = "/dev/" + szGroup + "/" + szVolume;
    struct stat info = {};
    if (stat(szPath.c_str(), &info) == 0) {
        const std::string szFolder =
            Format("/sys/dev/block/%u:%u", major(info.st_rdev), minor(info.st_rdev));
        volume.device = DeviceRead(szGroup + "/" + szVolume, szFolder, host);
    }
    volume.device.szPath = szPath;
    return volume;
}

GROUP *GroupOf(const std::string &szName, std::vector<GROUP> *pGroups)
{
    for (GROUP &group : *pGroups) {
        if (group.szName == szName) {
            return &group;
        }
    }
    pGroups->push_back({.szName = szName, .devices = {}, .volumes = {}});
    return &pGroups->back();
}

void RowTake(const std::string &szRow, const HOST &host, std::vector<GROUP> *pGroups)
{
    const WORDS fields = Split(szRow, ':');
    if (fields.size() < ROW_COUNT || fields[ROW_GROUP].empty()) {
        return;
    }
    GROUP *const pGroup = GroupOf(fields[ROW_GROUP], pGroups);
    if (!IsOneOf(pGroup->devices, fields[ROW_DEVICE])) {
        pGroup->devices.push_back(fields[ROW_DEVICE]);
    }
    const bool fKnown =
        std::any_of(pGroup->volumes.begin(), pGroup->volumes.end(),
                    [&](const VOLUME &volume) { return volume.szName == fields[ROW_VOLUME]; });
    if (!fields[ROW_VOLUME].empty() && !fKnown) {
        pGroup->volumes.push_back(VolumeRead(fields[ROW_GROUP], fields[ROW_VOLUME], host));
    }
}

void GroupsRead(const HOST &host, INVENTORY *pInventory)
{
    const std::string szRows = RunQuestion(
        {"/sbin/pvs", "-o", "pv_name,vg_name,lv_name,origin", "--noheading", "--separator", ":"});
    for (const std::string &szLine : Split(szRows, '\n')) {
        const std::string szRow = Trimmed(szLine);
        if (!szRow.empty()) {
            pInventory->rows.push_back(szRow);
            RowTake(szRow, host, &pInventory->groups);
        }
    }
}

} // namespace

SUPERBLOCK SuperblockParse(const std::string &szReport)
{
    SUPERBLOCK superblock;
    for (const std::string &szLine : Split(szReport, '\n')) {
        const size_t iColon = szLine.find(" : ");
        if (iColon == std::string::npos) {
            continue;
        }
        const std::string szKey = Trimmed(szLine.substr(0, iColon));
        const std::string szValue = Trimmed(szLine.substr(iColon + 3));
        const std::string szWord = szValue.substr(0, szValue.find(' '));
        if (szKey == "Array UUID" || szKey == "UUID") {
            superblock.fFound = true;
            superblock.szUuid = szWord;
        } else if (szKey == "Raid Level") {
            superblock.szLevel = szWord;
        } else if (szKey == "Raid Devices") {
            superblock.nDevices = NumberOf(szWord);
        } else if (szKey == "Device Role") {
            superblock.szRole = szValue;
        } else if (szKey == "Preferred Minor") {
            superblock.szMd = "md" + szWord;
        } else if (szKey == "Name") {
            const std::string szNumber = szWord.substr(szWord.rfind(':') + 1);
            const bool fNumber = !szNumber.empty() && isdigit(szNumber[0]) != 0;
            superblock.szMd = fNumber ? "md" + szNumber : "";
        }
    }
    return superblock;
}

INVENTORY InventoryRead(const HOST &host)
{
    INVENTORY inventory;
    inventory.disks = DisksRead(host);
    inventory.arrays = ArraysRead(inventory.disks, host);
    GroupsRead(host, &inventory);
    return inventory;
}

const DEVICE *InventoryFind(const INVENTORY &inventory, const std::string &szPath)
{
    for (const DISK &disk : inventory.disks) {
        if (disk.device.szPath == szPath) {
            return &disk.device;
        }
        for (const PARTITION &partition : disk.partitions) {
            if (partition.device.szPath == szPath) {
                return &partition.device;
            }
        }
    }
    for (const ARRAY &array : inventory.arrays) {
        if (array.device.szPath == szPath) {
            return &array.device;
        }
    }
    return nullptr;
}

const DISK *InventoryDiskOf(const INVENTORY &inventory, const std::string &szPath)
{
    for (const DISK &disk : inventory.disks) {
        const bool fPartition = std::any_of(
            disk.partitions.begin(), disk.partitions.end(),
            [&](const PARTITION &partition) { return partition.device.szPath == szPath; });
        if (disk.device.szPath == szPath || fPartition) {
            return &disk;
        }
    }
    return nullptr;
}
