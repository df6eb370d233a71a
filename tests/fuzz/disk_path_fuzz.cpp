// SPDX-License-Identifier: MIT
//
// The first line is the list of disks that an expansion unit reports, the rest a disk's path on a
// machine with every kind of port.
#include "hwcontrol/disk_name.h"
#include "hwcontrol/disk_path.h"

#include "fuzz.h"
#include "outside.h"

namespace
{

constexpr char CONF[] = "usbportcfg=0x30\nesataportcfg=0x40\ninternalportcfg=0x0f\n"
                        "cacheportcfg=0x80\nsupportsas=yes\n";

u32 ModelContainer(DISK_PORT_TYPE type)
{
    switch (type) {
    case ESATA_DEVICE:
        return 8;
    case EUNIT_DEVICE:
        return 2;
    case USB_DEVICE:
    case OTHER_DEVICE:
    case MMC_DEVICE:
        return 4;
    case CACHE_DEVICE:
        return 32;
    default:
        return 1;
    }
}

void ParseTells(const std::string &path)
{
    const DISK_PORT_TYPE type = ExternalDiskPortCheck(path.c_str());
    Claim(type >= UNKNOWN_DEVICE && type <= MMC_DEVICE, "a type of port");
    DISK_PATH_INFO info = {};
    const int result = DiskPathParse(path.c_str(), &info);
    Claim(result == (type == UNKNOWN_DEVICE ? -1 : 0), "a known device or not");
    if (result != 0) {
        return;
    }
    Claim(info.container == ModelContainer(type), "the container");
    Claim(type == EUNIT_DEVICE ||
              (info.unitIndex == 0 && static_cast<u32>(info.diskIndex) ==
                                          static_cast<u32>(DiskIndexGet(path.c_str())) + 1U),
          "the disk's number");

    u32 mask = 0x5555;
    const int contained = DiskContainerGet(path.c_str(), &mask);
    const bool fRefused = type == BOOT_DEVICE || type == ISD_DEVICE || type == MMC_DEVICE;
    Claim(contained == (fRefused ? -1 : 0), "a container or none");
    Claim(mask == (fRefused ? 0x5555 : ModelContainer(type)), "the container's mask");
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *pInput, size_t cbInput)
{
    std::string_view rest = InputText(pInput, cbInput);
    const std::string report = "nuro_device_list=" + std::string(TakeUntil(rest, '\n')) + "\n";
    OutsideClear();
    OutsideFile("/etc.defaults/nuroinfo.conf", CONF);
    OutsideFile("/sys/class/scsi_host/host0/nuro_pm_info", report);
    ParseTells(CString(rest));
    Claim(IsSupportSas() == 1, "the machine has SAS");
    return 0;
}
