// SPDX-License-Identifier: MIT
//
// The input is /proc/partitions.
#include "nurostoragecore/partition_enum.h"

#include "fuzz.h"
#include "text.h"

namespace
{

using PATHS = std::vector<std::string>;

PATHS ModelPaths(std::string_view file, std::string_view prefix)
{
    PATHS paths;
    for (const std::string &line : Lines(file, 1024)) {
        const std::vector<std::string> fields = Words(line, " \t");
        if (fields.size() == 4) {
            const std::string name = fields[3].substr(0, fields[3].size() - 1);
            if (name.starts_with(prefix)) {
                paths.push_back(("/dev/" + name).substr(0, 63));
            }
        }
    }
    std::sort(paths.begin(), paths.end());
    return paths;
}

void EnumTells(const PARTITION_ENUM_FILTER *pFilter, const PATHS &expected, bool fLine)
{
    PNLIBSZLIST pList = NLIBCSzListAlloc(512);
    const int nPaths = PartitionPathEnum(pFilter, &pList);
    Claim(nPaths == (fLine ? static_cast<int>(expected.size()) : -1), "as many paths");
    for (int i = 0; i < nPaths; i++) {
        Claim(NLIBCSzListGet(pList, i) == expected[static_cast<size_t>(i)], "the same paths");
    }
    NLIBCSzListFree(pList);
}

} // namespace

void Fuzz(std::string_view file)
{
    OutsideFile("/proc/partitions", file);
    OutsideFile("/etc.defaults/nuroinfo.conf", "usbportcfg=0x30\ninternalportcfg=0xf\n");
    EnumTells(nullptr, ModelPaths(file, ""), !file.empty());
    const PARTITION_ENUM_FILTER prefixed = {.szPrefix = "sd", .containerMask = 0};
    EnumTells(&prefixed, ModelPaths(file, "sd"), !file.empty());

    const PARTITION_ENUM_FILTER contained = {.szPrefix = "sd", .containerMask = 1};
    PNLIBSZLIST pList = NLIBCSzListAlloc(512);
    Claim(PartitionPathEnum(&contained, &pList) >= (file.empty() ? -1 : 0), "by container");
    NLIBCSzListFree(pList);
}
