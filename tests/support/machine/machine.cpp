// SPDX-License-Identifier: MIT
#include "sandbox.h"

#include "words.h"

#include <algorithm>
#include <cctype>

namespace
{

constexpr const char *CONF_PATH = "/etc.defaults/nuroinfo.conf";
constexpr const char *PARTITIONS_PATH = "/proc/partitions";
constexpr std::uint64_t SECTORS_PER_KIB = 2;

void MemberFileAdd(MACHINE &machine, const std::string &szPath, const std::string &szText)
{
    if (szText != NO_FILE) {
        MachineFile(machine, szPath, szText);
    }
}

void PartitionLineAdd(MACHINE &machine, const std::string &szName, std::uint64_t nSector)
{
    machine.files[PARTITIONS_PATH].szText +=
        "   8        0 " + std::to_string(nSector / SECTORS_PER_KIB) + " " + szName + "\n";
}

bool IsBelow(const std::string &szPath, const std::string &szFolder)
{
    return szPath == szFolder || szPath.starts_with(szFolder + "/");
}

template <typename MAP>
void BelowErase(MAP &map, const std::string &szFolder)
{
    std::erase_if(map, [&](const auto &entry) {
        if constexpr (requires { entry.first; }) {
            return IsBelow(entry.first, szFolder);
        } else {
            return IsBelow(entry, szFolder);
        }
    });
}

} // namespace

MACHINE MachineMake()
{
    MACHINE machine;
    machine.folders = {"/etc.defaults",        "/proc", "/run",    "/sys/block",
                       "/sys/class/scsi_host", "/tmp",  "/var/log"};
    MachineFile(machine, PARTITIONS_PATH, "major minor  #blocks  name\n\n");
    MachineFile(machine, "/proc/mounts", "rootfs / rootfs rw 0 0\n");
    MachineFile(machine, "/proc/devices",
                "Character devices:\n  1 mem\n\nBlock devices:\n  8 sd\n  9 md\n254 mdp\n");
    return machine;
}

void MachineFile(MACHINE &machine, const std::string &szPath, const std::string &szText,
                 mode_t mode)
{
    machine.files[szPath] = {szText, mode};
}

void MachineFolder(MACHINE &machine, const std::string &szPath)
{
    machine.folders.insert(szPath);
}

void MachineLink(MACHINE &machine, const std::string &szPath, const std::string &szTarget)
{
    machine.links[szPath] = szTarget;
}

void MachineRemove(MACHINE &machine, const std::string &szPath)
{
    BelowErase(machine.files, szPath);
    BelowErase(machine.folders, szPath);
    BelowErase(machine.links, szPath);
    BelowErase(machine.fifos, szPath);
}

void MachineConf(MACHINE &machine, const std::string &szText)
{
    MachineFile(machine, CONF_PATH, szText);
}

MACHINE MachineWithConf(const std::string &szText)
{
    MACHINE machine = MachineMake();
    MachineConf(machine, szText);
    return machine;
}

void MachineDiskAdd(MACHINE &machine, const std::string &szDisk, std::uint64_t nSector)
{
    MachineFile(machine, "/sys/block/" + szDisk + "/size", std::to_string(nSector) + "\n");
    MachineFile(machine, "/dev/" + szDisk, "");
    PartitionLineAdd(machine, szDisk, nSector);
}

std::string MachinePartitionAdd(MACHINE &machine, const std::string &szDisk, int nPartition,
                                std::uint64_t start, std::uint64_t size)
{
    const bool fDigit = isdigit(static_cast<unsigned char>(szDisk.back())) != 0;
    const std::string szName = szDisk + (fDigit ? "p" : "") + std::to_string(nPartition);
    const std::string szFolder = "/sys/block/" + szDisk + "/" + szName;
    MachineFile(machine, szFolder + "/start", std::to_string(start) + "\n");
    MachineFile(machine, szFolder + "/size", std::to_string(size) + "\n");
    MachineFile(machine, "/dev/" + szName, "");
    PartitionLineAdd(machine, szName, size);
    return szName;
}

void MachineMdAdd(MACHINE &machine, const MACHINE_MD &md)
{
    const std::string szName = "md" + std::to_string(md.nMd);
    const std::string szFolder = "/sys/block/" + szName + "/md";
    MachineFile(machine, "/dev/" + szName, "");
    MachineFolder(machine, szFolder);
    MemberFileAdd(machine, szFolder + "/sync_action", md.szSyncAction);
    MemberFileAdd(machine, szFolder + "/component_size", md.szComponentSize);
    for (const MACHINE_MEMBER &member : md.members) {
        const std::string szMember = szFolder + "/dev-" + member.szName;
        MachineFolder(machine, szMember);
        MemberFileAdd(machine, szMember + "/state", member.szState);
        MemberFileAdd(machine, szMember + "/slot", member.szSlot);
    }
    machine.arrays.push_back(md);
}

void MachineTool(MACHINE &machine, std::string_view szCommand, const TOOL_ANSWER &answer)
{
    MachineTool(machine, Split(szCommand, ' '), answer);
}

void MachineTool(MACHINE &machine, const std::vector<std::string> &argv, const TOOL_ANSWER &answer)
{
    machine.rows.push_back({argv, answer});
}

void MachineTool(MACHINE &machine, std::initializer_list<std::string> argv,
                 const TOOL_ANSWER &answer)
{
    MachineTool(machine, std::vector<std::string>(argv), answer);
}
