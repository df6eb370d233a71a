// SPDX-License-Identifier: MIT
#include "warnings.h"

#include "inventory.h"
#include "outcome.h"
#include "run.h"
#include "text.h"

#include <algorithm>
#include <string>
#include <sys/wait.h>
#include <vector>

namespace
{

constexpr int LAST_SYSTEM_PARTITION = 2;
constexpr char CONFIGURATION[] = "/etc.defaults/nuroinfo.conf";

using SENTENCES = std::vector<std::string>;

std::string NameOf(const std::string &szPath)
{
    return szPath.substr(szPath.rfind('/') + 1);
}

bool Contains(const std::string &szText, const std::string &szPart)
{
    return szText.find(szPart) != std::string::npos;
}

// Why a device cannot be changed now; empty when it can.
std::string UseOf(const DEVICE &device, const OUTCOME &outcome)
{
    WORDS uses;
    for (const std::string &szHolder : device.holders) {
        if (!IsOneOf(outcome.stopped, "/dev/" + szHolder)) {
            uses.push_back("held by " + szHolder);
        }
    }
    for (const std::string &szMount : device.mounts) {
        uses.push_back("mounted at " + szMount);
    }
    if (device.fSwap) {
        uses.emplace_back("used as swap");
    }
    return Join(uses, ", ");
}

// Devices of volumes go when their group does.
bool IsOfRemovedGroup(const std::string &szArray, const SCENE &scene)
{
    return std::any_of(
        scene.inventory.groups.begin(), scene.inventory.groups.end(), [&](const GROUP &group) {
            return IsOneOf(group.devices, szArray) && IsOneOf(scene.outcome.groups, group.szName) &&
                   std::all_of(group.volumes.begin(), group.volumes.end(),
                               [](const VOLUME &volume) { return volume.device.mounts.empty(); });
        });
}

void InUseFind(const SCENE &scene, SENTENCES &found)
{
    for (const std::string &szPath : scene.outcome.taken) {
        const DEVICE *const pDevice = InventoryFind(scene.inventory, szPath);
        const bool fArray = pDevice != nullptr && Contains(szPath, "/md");
        const std::string szUse =
            pDevice == nullptr || fArray ? "" : UseOf(*pDevice, scene.outcome);
        if (!szUse.empty()) {
            found.push_back(szPath + " is in use (" + szUse +
                            "): the programs will refuse to change it, and the real run will end "
                            "otherwise than this rehearsal");
        }
    }
    for (const std::string &szPath : scene.outcome.stopped) {
        const DEVICE *const pDevice = InventoryFind(scene.inventory, szPath);
        const bool fGoes = IsOfRemovedGroup(szPath, scene);
        const std::string szUse =
            pDevice == nullptr || (fGoes && pDevice->mounts.empty() && !pDevice->fSwap)
                ? ""
                : UseOf(*pDevice, scene.outcome);
        if (!szUse.empty()) {
            found.push_back(szPath + " is in use (" + szUse +
                            "): it will not stop, and the real run will end otherwise than this "
                            "rehearsal");
        }
    }
}

bool HasSystemPartition(const DISK &disk)
{
    return std::any_of(
        disk.partitions.begin(), disk.partitions.end(),
        [](const PARTITION &partition) { return partition.number <= LAST_SYSTEM_PARTITION; });
}

void CutOffFind(const SCENE &scene, SENTENCES &found)
{
    for (const DISK_OUTCOME &outcome : scene.outcome.disks) {
        for (const PARTITION &partition : outcome.pDisk->partitions) {
            if (partition.device.superblock.fFound && !HasSystemPartition(*outcome.pDisk) &&
                IsOneOf(outcome.taken, partition.device.szPath)) {
                found.push_back(outcome.pDisk->device.szPath +
                                " has no partitions 1 and 2 and is taken for blank, but " +
                                partition.device.szPath +
                                " carries the superblock of an array: it looks like a run that was "
                                "cut off: recovery.md, row 1; running again loses the data");
            }
        }
    }
}

const PARTITION *PartitionFind(const DISK &disk, int number)
{
    for (const PARTITION &partition : disk.partitions) {
        if (partition.number == number) {
            return &partition;
        }
    }
    return nullptr;
}

// Another disk whose system partition is in the same place, and has a swap partition behind it.
bool HasWholeTwin(const INVENTORY &inventory, const PARTITION &system)
{
    return std::any_of(inventory.disks.begin(), inventory.disks.end(), [&](const DISK &disk) {
        const PARTITION *const pSystem = PartitionFind(disk, 1);
        return pSystem != nullptr && PartitionFind(disk, LAST_SYSTEM_PARTITION) != nullptr &&
               pSystem->start == system.start && pSystem->device.nSector == system.device.nSector;
    });
}

// initsys leaves such a disk out and ends with 0, but where it knows no disk's layout.
void HalfMadeFind(const SCENE &scene, SENTENCES &found)
{
    if (scene.options.words.empty() || scene.options.words[0].rfind("initsys", 0) != 0) {
        return;
    }
    for (const DISK_OUTCOME &outcome : scene.outcome.disks) {
        const PARTITION *const pSystem = PartitionFind(*outcome.pDisk, 1);
        if (!outcome.fAsked || pSystem == nullptr ||
            IsOneOf(outcome.taken, pSystem->device.szPath) ||
            PartitionFind(*outcome.pDisk, LAST_SYSTEM_PARTITION) != nullptr ||
            !HasWholeTwin(scene.inventory, *pSystem)) {
            continue;
        }
        const bool fData = outcome.pDisk->partitions.size() > 1;
        found.push_back(Format("%s has partition 1 without 2 and is left out: it looks like a run "
                               "that was cut off: recovery.md, row %d",
                               outcome.pDisk->device.szPath.c_str(), fData ? 4 : 6));
    }
}

// The array whose LVM the tool takes down is the one whose label it removes at the end.
WORDS LabelsRemoved(const RUN &run)
{
    WORDS paths;
    for (const COMMAND &command : run.commands) {
        if (!command.fQuestion && NameOf(command.argv[0]) == "pvremove") {
            paths.push_back(command.argv.back());
        }
    }
    return paths;
}

void WrongRowFind(const SCENE &scene, SENTENCES &found)
{
    for (const std::string &szPath : LabelsRemoved(scene.run)) {
        for (const std::string &szRow : scene.inventory.rows) {
            const WORDS fields = Split(szRow, ':');
            if (Contains(szRow, szPath) && fields[0] != szPath) {
                found.push_back("pvs has a row that contains " + szPath + " without being it: \"" +
                                szRow + "\"; the group that is removed is " +
                                Join(scene.outcome.groups, ", "));
            }
        }
    }
}

void WideGroupFind(const SCENE &scene, SENTENCES &found)
{
    for (const GROUP &group : scene.inventory.groups) {
        if (IsOneOf(scene.outcome.groups, group.szName) && group.devices.size() > 1) {
            found.push_back("the group " + group.szName +
                            " lies on more than one device: " + Join(group.devices, ", "));
        }
    }
}

// What the tool itself says of reports that it cannot read.
constexpr const char *UNREAD_REPORTS[] = {
    "bad version format:", "bad device order format:",         "Failed to trim key:",
    "Failed to trim val:", "Fail to read the report of mdadm", "Fail to do [/sbin/mdadm -E",
};

void LogFind(const SCENE &scene, const char *szPart, const char *szMeaning, SENTENCES &found)
{
    for (const LOG_LINE &line : scene.run.log) {
        const std::string szText = szMeaning + (": " + line.szText);
        if (Contains(line.szText, szPart) && !IsOneOf(found, szText)) {
            found.push_back(szText);
        }
    }
}

void UnreadReportFind(const SCENE &scene, SENTENCES &found)
{
    for (const char *const szPart : UNREAD_REPORTS) {
        LogFind(scene, szPart, "the tool could not read a report of mdadm -E", found);
    }
}

void FailedListingFind(const SCENE &scene, SENTENCES &found)
{
    for (const COMMAND &command : scene.run.commands) {
        if (!command.fQuestion || command.status == 0 || NameOf(command.argv[0]) == "mdadm") {
            continue;
        }
        const std::string szText =
            "a listing failed, and may be taken for an empty one: " + ShellLine(command.argv) +
            (WIFEXITED(command.status) ? Format(" (status %d)", WEXITSTATUS(command.status))
                                       : Format(" (signal %d)", WTERMSIG(command.status)));
        if (!IsOneOf(found, szText)) {
            found.push_back(szText);
        }
    }
}

bool IsForeign(const SIGNATURE &signature, bool fWholeDisk)
{
    if (fWholeDisk) {
        return signature.szType != "dos";
    }
    return signature.szType != "linux_raid_member" && signature.szType != "swap";
}

void ForeignFind(const DEVICE &device, bool fWholeDisk, SENTENCES &found)
{
    for (const SIGNATURE &signature : device.signatures) {
        if (IsForeign(signature, fWholeDisk)) {
            found.push_back(device.szPath + " carries a signature that is not the appliance's: " +
                            signature.szType +
                            (signature.szLabel.empty() ? "" : " \"" + signature.szLabel + "\""));
        }
    }
}

void ForeignSignatureFind(const SCENE &scene, SENTENCES &found)
{
    for (const DISK_OUTCOME &outcome : scene.outcome.disks) {
        if (outcome.fSigned) {
            ForeignFind(outcome.pDisk->device, true, found);
        }
        for (const PARTITION &partition : outcome.pDisk->partitions) {
            if (IsOneOf(outcome.taken, partition.device.szPath)) {
                ForeignFind(partition.device, false, found);
            }
        }
    }
}

void MountedFind(const SCENE &scene, SENTENCES &found)
{
    for (const LOSS &loss : scene.outcome.losses) {
        if (!loss.mounts.empty()) {
            found.push_back(loss.szText + " is mounted at " + Join(loss.mounts, ", "));
        }
    }
}

struct MARKER_ROW {
    const char *szPath;
    const char *szMeaning;
};

constexpr MARKER_ROW MARKERS[] = {
    {"/.force_clean_all_disk", "every disk is wiped"},
    {"/tmp/raid.0", "newvol makes a RAID 0"},
    {"/tmp/raid.1", "newvol makes a RAID 1"},
    {"/tmp/raid.5", "newvol makes a RAID 5"},
};

struct HEAD_ROW {
    const char *szMarker;
    bool fTwoHeads;
};

constexpr HEAD_ROW HEADS[] = {{"/tmp/.dualhead", true}, {"/tmp/.not.dualhead", false}};

bool ConfiguredWithTwoHeads()
{
    constexpr char KEY[] = "support_dual_head=";
    for (const std::string &szLine : Split(FileRead(CONFIGURATION).value_or(""), '\n')) {
        if (szLine.rfind(KEY, 0) == 0) {
            const std::string szValue = Trimmed(szLine.substr(sizeof(KEY) - 1));
            return szValue == "yes" || szValue == "\"yes\"";
        }
    }
    return false;
}

// Markers are those that were there before the tool ran.
void MarkerFind(const SCENE &scene, SENTENCES &found)
{
    for (const MARKER_ROW &row : MARKERS) {
        if (IsOneOf(scene.host.markers, row.szPath)) {
            found.push_back("the marker " + std::string(row.szPath) + " is set: " + row.szMeaning);
        }
    }
    for (const HEAD_ROW &row : HEADS) {
        if (IsOneOf(scene.host.markers, row.szMarker) &&
            row.fTwoHeads != ConfiguredWithTwoHeads()) {
            found.push_back("the marker " + std::string(row.szMarker) +
                            " contradicts support_dual_head in " + CONFIGURATION);
        }
    }
}

// What the tool says when it does not know how many disks the machine has room for. Every disk is
// one too many then: it is partitioned, and its members are erased.
constexpr const char *NO_SLOTS[] = {
    "Failed to NLIBCFileGetKeyValue(",
    "No disk to create system and swap partition",
};

void NoSlotsFind(const SCENE &scene, SENTENCES &found)
{
    for (const char *const szPart : NO_SLOTS) {
        LogFind(scene, szPart, "no disk has a slot, look at maxdisks and max_sys_raid_disks",
                found);
    }
}

void BadDiskFind(const SCENE &scene, SENTENCES &found)
{
    for (const DISK_OUTCOME &outcome : scene.outcome.disks) {
        const std::string &szPath = outcome.pDisk->device.szPath;
        if (!outcome.fAsked || outcome.fate == FATE::ALONE) {
            continue;
        }
        if (outcome.pDisk->fReadOnly) {
            found.push_back(szPath + " is read-only: the command fails at it, after others have "
                                     "been changed");
        }
        if (!outcome.pDisk->device.fReadable) {
            found.push_back(szPath + " cannot be read: the command fails at it, after others have "
                                     "been changed");
        }
        for (const MISFIT &misfit : outcome.misfits) {
            found.push_back(Format("%s is too small for partition %d, which begins at sector %llu: "
                                   "the command fails at it, after others have been changed",
                                   szPath.c_str(), misfit.number,
                                   static_cast<unsigned long long>(misfit.start)));
        }
    }
}

// These are not read, so they are neither counted as members nor wiped.
void OddMemberFind(const SCENE &scene, SENTENCES &found)
{
    for (const DISK &disk : scene.inventory.disks) {
        for (const PARTITION &partition : disk.partitions) {
            const std::string &szRole = partition.device.superblock.szRole;
            if (szRole == "Journal" || szRole.rfind("Replacement", 0) == 0) {
                found.push_back(partition.device.szPath +
                                " is a member that the tool does not "
                                "read: mdadm -E calls it \"" +
                                szRole + "\"");
            }
        }
    }
}

void IncompleteFind(const SCENE &scene, SENTENCES &found)
{
    if (scene.options.words.size() != 2 || scene.options.words[0] != "destroy") {
        return;
    }
    const std::string szName = "md" + scene.options.words[1];
    for (const ARRAY &array : scene.inventory.arrays) {
        if (array.device.szName != szName) {
            continue;
        }
        if (!array.fRunning) {
            found.push_back("the array " + szName + " is not assembled, so it is not found; its " +
                            "superblocks stay on " + Join(array.members, ", ") +
                            ": recovery.md, rows 11 to 13");
        } else if (array.nMissing > 0) {
            found.push_back(Format("the array %s lacks %llu of its members: their superblocks stay",
                                   szName.c_str(),
                                   static_cast<unsigned long long>(array.nMissing)));
        }
    }
}

void SurvivorFind(const SCENE &scene, SENTENCES &found)
{
    for (const ARRAY &array : scene.inventory.arrays) {
        if (!IsOneOf(scene.outcome.stopped, array.device.szPath)) {
            continue;
        }
        for (const std::string &szMember : array.members) {
            if (!IsOneOf(scene.outcome.taken, "/dev/" + szMember)) {
                found.push_back("the superblock on /dev/" + szMember + " survives: " +
                                array.device.szPath + " is stopped, and can come back");
            }
        }
    }
}

void LeftOutFind(const SCENE &scene, SENTENCES &found)
{
    LogFind(scene, "partitions left out, no room in the command",
            "there are more disks than a command has room for", found);
}

void OtherRunFind(const SCENE &scene, SENTENCES &found)
{
    for (const pid_t pid : scene.host.otherRuns) {
        found.push_back(Format("%s runs at this moment, as process %d",
                               NameOf(scene.options.szTool).c_str(), static_cast<int>(pid)));
    }
}

void UdevFind(const SCENE &scene, SENTENCES &found)
{
    const bool fChanges = std::any_of(scene.run.commands.begin(), scene.run.commands.end(),
                                      [](const COMMAND &command) { return !command.fQuestion; });
    for (const std::string &szRule : fChanges ? scene.host.udevRules : WORDS()) {
        found.push_back("udev runs and " + szRule +
                        " is not masked: it acts on arrays or groups while the command works on "
                        "them");
    }
}

// A command that looks at whole disks leaves out those that are not the machine's own.
void UnseenDiskFind(const SCENE &scene, SENTENCES &found)
{
    const bool fWhole =
        std::any_of(scene.run.commands.begin(), scene.run.commands.end(),
                    [&](const COMMAND &command) { return NameOf(command.argv[0]) == "sfdisk"; });
    for (const DISK_OUTCOME &outcome : scene.outcome.disks) {
        if (fWhole && !outcome.fAsked) {
            found.push_back("the command does not look at " + outcome.pDisk->device.szPath);
        }
    }
}

void BadEndFind(const SCENE &scene, SENTENCES &found)
{
    if (!WIFEXITED(scene.run.status)) {
        found.push_back(Format("the tool was ended by signal %d", WTERMSIG(scene.run.status)));
    }
}

struct WARNING_ROW {
    const char *szKind;
    void (*pFind)(const SCENE &scene, SENTENCES &found);
};

constexpr WARNING_ROW WARNING_ROWS[] = {
    {"in-use", InUseFind},
    {"cut-off", CutOffFind},
    {"cut-off", HalfMadeFind},
    {"wrong-row", WrongRowFind},
    {"wide-group", WideGroupFind},
    {"unread-report", UnreadReportFind},
    {"failed-listing", FailedListingFind},
    {"foreign-signature", ForeignSignatureFind},
    {"mounted", MountedFind},
    {"marker", MarkerFind},
    {"no-slots", NoSlotsFind},
    {"bad-disk", BadDiskFind},
    {"odd-member", OddMemberFind},
    {"incomplete-array", IncompleteFind},
    {"survivor", SurvivorFind},
    {"left-out", LeftOutFind},
    {"other-run", OtherRunFind},
    {"udev", UdevFind},
    {"unseen-disk", UnseenDiskFind},
    {"bad-end", BadEndFind},
};

} // namespace

std::vector<WARNING> WarningsFind(const SCENE &scene)
{
    std::vector<WARNING> warnings;
    for (const WARNING_ROW &row : WARNING_ROWS) {
        SENTENCES found;
        row.pFind(scene, found);
        for (const std::string &szText : found) {
            warnings.push_back({.szKind = row.szKind, .szText = szText});
        }
    }
    return warnings;
}
