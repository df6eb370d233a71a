// SPDX-License-Identifier: MIT
//
// The first byte is the size of the caller's buffer in steps of 16, the rest what a SCSI host says
// of the expansion unit behind it. A second host always reports sdz.
#include "hwcontrol/disk_port.h"

#include "conf.h"
#include "fuzz.h"
#include "port.h"

namespace
{

constexpr char KEY[] = "nuro_device_list";
constexpr char SECOND_HOST[] = "nuro_device_list=/dev/sdz\n";

} // namespace

void Fuzz(std::string_view input)
{
    if (input.empty()) {
        return;
    }
    const size_t cbOut = static_cast<unsigned char>(input[0]) * size_t(16) + 1;
    const std::string_view file = input.substr(1);
    OutsideFile("/sys/class/scsi_host/host0/nuro_pm_info", file);
    OutsideFile("/sys/class/scsi_host/host1/nuro_pm_info", SECOND_HOST);
    std::vector<char> out(cbOut, '#');
    const int result = ExternalDiskPortEnumEunit(0, out.data(), static_cast<int>(cbOut));

    std::vector<std::string> names = UnitNames(ConfLookup(file, KEY, 256).text);
    names.emplace_back("sdz");
    std::string expected;
    bool fFits = true;
    for (const std::string &name : names) {
        fFits = fFits && expected.size() + name.size() <= cbOut;
        expected = fFits ? (expected + name + " ").substr(0, cbOut - 1) : expected;
    }
    Claim(result == (fFits ? 0 : -1), "everything fits or not");
    Claim(out.data() == expected, "the names reported");
}
