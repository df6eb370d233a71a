// SPDX-License-Identifier: MIT
//
// The first line is the list of disks that an expansion unit reports, the rest a disk's path on a
// machine with every kind of port.
#include "hwcontrol/disk_path.h"

#include "conf.h"
#include "fuzz.h"
#include "port.h"

namespace
{

constexpr char CONF[] = "usbportcfg=0x30\nesataportcfg=0x40\ninternalportcfg=0x0f\n"
                        "cacheportcfg=0x80\nsupportsas=yes\n";
constexpr PORT_MASKS MASKS = {0x30, 0x40, 0x0f, 0x80};
constexpr size_t LONGEST_NAME = 31;

void PortTells(const std::string &path, DISK_PORT_TYPE type, std::string_view report)
{
    const std::string disk = WithoutPartitionNumber(path);
    const size_t folder = disk.find("/dev");
    const bool fNoName = folder != std::string::npos && disk.find('/', folder + 1) == disk.npos;
    if (path.size() > LONGEST_NAME || fNoName) {
        return;
    }
    std::string units;
    for (const std::string &name : UnitNames(ConfLookup(report, "nuro_device_list", 256).text)) {
        units += name + " ";
    }
    Claim(type == static_cast<int>(PortOfPath(MASKS, path, units)), "the type of port");
}

void ParseTells(const std::string &path, std::string_view report)
{
    const DISK_PORT_TYPE type = ExternalDiskPortCheck(path.c_str());
    Claim(type >= UNKNOWN_DEVICE && type <= MMC_DEVICE, "a type of port");
    PortTells(path, type, report);
    DISK_PATH_INFO info = {};
    const int result = DiskPathParse(path.c_str(), &info);
    Claim(result == (type == UNKNOWN_DEVICE ? -1 : 0), "a known device or not");
    if (result != 0) {
        return;
    }
    const bool fRefused = type == BOOT_DEVICE || type == ISD_DEVICE || type == MMC_DEVICE;
    const u32 container = ContainerOf(static_cast<PORT>(type));
    const u32 parsed = type == MMC_DEVICE ? 4 : 1;
    Claim(info.container == (fRefused ? parsed : container), "the container");
    Claim(type == EUNIT_DEVICE ||
              (info.unitIndex == 0 &&
               static_cast<u32>(info.diskIndex) == static_cast<u32>(DiskIndex(path)) + 1U),
          "the disk's number");

    u32 mask = 0x5555;
    const int contained = DiskContainerGet(path.c_str(), &mask);
    Claim(contained == (fRefused ? -1 : 0), "a container or none");
    Claim(mask == (fRefused ? 0x5555 : container), "the container's mask");
}

} // namespace

void Fuzz(std::string_view rest)
{
    const std::string report = "nuro_device_list=" + std::string(TakeUntil(rest, '\n')) + "\n";
    OutsideFile("/etc.defaults/nuroinfo.conf", CONF);
    OutsideFile("/sys/class/scsi_host/host0/nuro_pm_info", report);
    ParseTells(CString(rest), report);
    Claim(IsSupportSas() == 1, "the machine has SAS");
}
