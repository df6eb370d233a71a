// SPDX-License-Identifier: MIT
#include "host.h"

#include "options.h"
#include "owner.h"
#include "text.h"

#include <array>
#include <climits>
#include <cstdlib>
#include <string>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <vector>

namespace
{

// Fields of /proc/self/mountinfo.
constexpr size_t MOUNT_DEVICE = 2;
constexpr size_t MOUNT_PATH = 4;

// "\040" and the like.
std::string Unescaped(const std::string &szText)
{
    constexpr size_t DIGITS = 3;
    std::string szPlain;
    for (size_t i = 0; i < szText.size(); i++) {
        if (szText[i] == '\\' && i + DIGITS < szText.size()) {
            szPlain += static_cast<char>(strtol(szText.substr(i + 1, DIGITS).c_str(), nullptr, 8));
            i += DIGITS;
        } else {
            szPlain += szText[i];
        }
    }
    return szPlain;
}

std::vector<MOUNT> MountsRead()
{
    std::vector<MOUNT> mounts;
    for (const std::string &szLine : Split(FileRead("/proc/self/mountinfo").value_or(""), '\n')) {
        const WORDS fields = Split(szLine, ' ');
        if (fields.size() <= MOUNT_PATH) {
            continue;
        }
        const WORDS numbers = Split(fields[MOUNT_DEVICE], ':');
        if (numbers.size() == 2) {
            mounts.push_back({.device = makedev(static_cast<unsigned>(NumberOf(numbers[0])),
                                                static_cast<unsigned>(NumberOf(numbers[1]))),
                              .szPath = Unescaped(fields[MOUNT_PATH])});
        }
    }
    return mounts;
}

std::vector<dev_t> SwapsRead()
{
    std::vector<dev_t> swaps;
    for (const std::string &szLine : Split(FileRead("/proc/swaps").value_or(""), '\n')) {
        struct stat info = {};
        const std::string szPath = Unescaped(szLine.substr(0, szLine.find_first_of(" \t")));
        if (!szPath.empty() && stat(szPath.c_str(), &info) == 0 && S_ISBLK(info.st_mode)) {
            swaps.push_back(info.st_rdev);
        }
    }
    return swaps;
}

std::string RealPath(const std::string &szPath)
{
    const HEAP_OWNER szReal(realpath(szPath.c_str(), nullptr));
    return szReal == nullptr ? "" : szReal.get();
}

// What a link of /proc says; empty when the process has none, as those of the kernel.
std::string LinkRead(const std::string &szPath)
{
    std::array<char, PATH_MAX> target = {};
    const ssize_t cch = readlink(szPath.c_str(), target.data(), target.size() - 1);
    return cch < 0 ? "" : target.data();
}

std::vector<pid_t> RunsFind(const std::string &szTool)
{
    std::vector<pid_t> runs;
    const std::string szReal = RealPath(szTool);
    const std::string szName = szTool.substr(szTool.rfind('/') + 1);
    for (const std::string &szEntry : FolderList("/proc")) {
        if (szEntry.find_first_not_of("0123456789") != std::string::npos) {
            continue;
        }
        const std::string szProcess = "/proc/" + szEntry;
        if ((!szReal.empty() && LinkRead(szProcess + "/exe") == szReal) ||
            AttributeRead(szProcess + "/comm") == szName) {
            runs.push_back(static_cast<pid_t>(NumberOf(szEntry)));
        }
    }
    return runs;
}

constexpr char UDEV_CONTROL[] = "/run/udev/control";
constexpr const char *ACTING_RULES[] = {"64-md-raid-assembly.rules", "69-lvm.rules"};
constexpr const char *RULE_FOLDERS[] = {"/etc/udev/rules.d", "/run/udev/rules.d",
                                        "/usr/local/lib/udev/rules.d", "/usr/lib/udev/rules.d",
                                        "/lib/udev/rules.d"};

// The first file of a name counts for udev. One that is empty, as /dev/null is, masks the others.
WORDS UdevRulesFind()
{
    WORDS rules;
    for (const char *const szRule : ACTING_RULES) {
        for (const char *const szFolder : RULE_FOLDERS) {
            struct stat info = {};
            const std::string szPath = std::string(szFolder) + "/" + szRule;
            if (stat(szPath.c_str(), &info) != 0) {
                continue;
            }
            if (info.st_size > 0) {
                rules.push_back(szPath);
            }
            break;
        }
    }
    return access(UDEV_CONTROL, F_OK) == 0 ? rules : WORDS();
}

constexpr const char *MARKERS[] = {
    "/.force_clean_all_disk",
    "/tmp/.dualhead",
    "/tmp/.not.dualhead",
    "/tmp/raid.0",
    "/tmp/raid.1",
    "/tmp/raid.5",
};

WORDS MarkersFind()
{
    WORDS markers;
    for (const char *const szMarker : MARKERS) {
        if (access(szMarker, F_OK) == 0) {
            markers.emplace_back(szMarker);
        }
    }
    return markers;
}

} // namespace

HOST HostRead(const OPTIONS &options)
{
    return {.mounts = MountsRead(),
            .swaps = SwapsRead(),
            .otherRuns = RunsFind(options.szToolPath),
            .udevRules = UdevRulesFind(),
            .markers = MarkersFind()};
}
