// SPDX-License-Identifier: MIT
#include "print.h"

#include "bar.h"
#include "host.h"
#include "inventory.h"
#include "json.h"
#include "options.h"
#include "outcome.h"
#include "places.h"
#include "run.h"
#include "text.h"
#include "warnings.h"

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <string>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>
#include <vector>

namespace
{

constexpr std::uint64_t SECTOR_SIZE = 512;

void Title(const char *szTitle)
{
    (void)printf("\n%s\n", szTitle);
}

void Lines(const char *szTitle, const WORDS &lines, const char *szNone)
{
    Title(szTitle);
    for (const std::string &szLine : lines) {
        (void)printf("  %s\n", szLine.c_str());
    }
    if (lines.empty()) {
        (void)printf("  %s\n", szNone);
    }
}

// --- what a disk holds -------------------------------------------------------------------------

std::string ArrayWord(const ARRAY &array)
{
    const std::string szName =
        array.device.szName.empty() ? "an array without a number" : array.device.szName;
    if (!array.fRunning) {
        return szName + " (not assembled)";
    }
    return szName + (array.nMissing > 0 ? " (degraded)" : " (running)");
}

std::string DeviceWord(const DEVICE &device, const INVENTORY &inventory)
{
    WORDS words;
    for (const ARRAY &array : inventory.arrays) {
        if (IsOneOf(array.members, device.szName)) {
            words.push_back(ArrayWord(array));
        }
    }
    for (const SIGNATURE &signature : device.signatures) {
        if (signature.szType != "linux_raid_member") {
            words.push_back(signature.szType +
                            (signature.szLabel.empty() ? "" : " \"" + signature.szLabel + "\""));
        }
    }
    for (const std::string &szMount : device.mounts) {
        words.push_back("mounted at " + szMount);
    }
    return Join(words, " ");
}

std::string LayoutWord(const DISK &disk)
{
    const std::string szVersion = LayoutVersionText(disk);
    return szVersion.empty() ? "" : "layout " + szVersion;
}

std::string HoldsText(const DISK &disk, const INVENTORY &inventory)
{
    WORDS words;
    const std::string szLayout = LayoutWord(disk);
    if (!szLayout.empty()) {
        words.push_back(szLayout);
    }
    const std::string szWhole = DeviceWord(disk.device, inventory);
    if (!szWhole.empty() && szWhole != "dos") {
        words.push_back(szWhole);
    }
    for (const PARTITION &partition : disk.partitions) {
        const std::string szWord = DeviceWord(partition.device, inventory);
        words.push_back(Format("%d: ", partition.number) +
                        (szWord.empty() ? "nothing known" : szWord));
    }
    return words.empty() ? "blank" : Join(words, ", ");
}

void DiskPrint(const DISK_OUTCOME &outcome, const INVENTORY &inventory)
{
    const DISK &disk = *outcome.pDisk;
    (void)printf("  %s  %s  %s  %s  holds %s  -> %s\n", disk.device.szPath.c_str(),
                 SizeText(disk.device.nSector * SECTOR_SIZE).c_str(),
                 disk.szModel.empty() ? "no model" : disk.szModel.c_str(),
                 disk.szSerial.empty() ? "no serial" : disk.szSerial.c_str(),
                 HoldsText(disk, inventory).c_str(), FateText(outcome.fate));
    if (isatty(STDOUT_FILENO) != 0) {
        (void)printf("    now   |%s|\n    then  |%s|\n", BarOf(disk).c_str(),
                     BarOf(outcome).c_str());
    }
}

// --- the parts ---------------------------------------------------------------------------------

WORDS LossLines(const OUTCOME &outcome)
{
    WORDS lines;
    for (const LOSS &loss : outcome.losses) {
        lines.push_back(loss.szText + (loss.mounts.empty()
                                           ? ""
                                           : " (MOUNTED at " + Join(loss.mounts, ", ") + ")"));
    }
    return lines;
}

WORDS WarningLines(const std::vector<WARNING> &warnings)
{
    WORDS lines;
    for (const WARNING &warning : warnings) {
        lines.push_back(warning.szText);
    }
    return lines;
}

WORDS CommandLines(const RUN &run)
{
    WORDS lines;
    for (const COMMAND &command : run.commands) {
        if (!command.fQuestion) {
            lines.push_back(ShellLine(command.argv));
        }
    }
    return lines;
}

WORDS LogLines(const RUN &run)
{
    WORDS lines;
    for (const LOG_LINE &line : run.log) {
        lines.push_back(Format("%s %s", LOG_PRI(line.priority) == LOG_DEBUG ? "debug" : "err",
                               line.szText.c_str()));
    }
    return lines;
}

WORDS OutputLines(const std::string &szText)
{
    WORDS lines = Split(szText, '\n');
    if (lines.back().empty()) {
        lines.pop_back();
    }
    return lines;
}

void TextPrint(const SCENE &scene, const std::vector<WARNING> &warnings)
{
    const std::string &szTool = scene.options.szTool;
    (void)printf("Rehearsal of %s %s: nothing has been changed.\n",
                 szTool.substr(szTool.rfind('/') + 1).c_str(),
                 ShellLine(scene.options.words).c_str());
    Title("The disks, and what becomes of them:");
    for (const DISK_OUTCOME &outcome : scene.outcome.disks) {
        DiskPrint(outcome, scene.inventory);
    }
    Lines("What is lost:", LossLines(scene.outcome), "nothing");
    Lines("What should make you stop:", WarningLines(warnings), "nothing");
    Lines("The commands:", CommandLines(scene.run), "none");
    Lines("What it prints:", OutputLines(scene.run.szOut), "nothing");
    if (!scene.run.szErr.empty()) {
        Lines("What it prints to standard error:", OutputLines(scene.run.szErr), "nothing");
    }
    Lines("What it logs:", LogLines(scene.run), "nothing");
    if (WIFEXITED(scene.run.status)) {
        (void)printf("\nIts exit status: %d\n", WEXITSTATUS(scene.run.status));
    }
}

void CommandsPrint(const SCENE &scene, const std::vector<WARNING> &)
{
    for (const std::string &szLine : CommandLines(scene.run)) {
        (void)puts(szLine.c_str());
    }
}

struct FORM_ROW {
    FORM form;
    void (*pPrint)(const SCENE &scene, const std::vector<WARNING> &warnings);
};

constexpr FORM_ROW FORMS[] = {
    {FORM::TEXT, TextPrint},
    {FORM::COMMANDS, CommandsPrint},
    {FORM::JSON, JsonPrint},
};

} // namespace

void ScenePrint(const SCENE &scene, const std::vector<WARNING> &warnings)
{
    for (const FORM_ROW &row : FORMS) {
        if (row.form == scene.options.form) {
            row.pPrint(scene, warnings);
        }
    }
}

int RehearsalPrint(const OPTIONS &options, const HOST &host, const RUN &run)
{
    const INVENTORY inventory = InventoryRead(host);
    const OUTCOME outcome = OutcomeOf(inventory, run);
    const SCENE scene = {
        .options = options, .host = host, .run = run, .inventory = inventory, .outcome = outcome};
    const std::vector<WARNING> warnings = WarningsFind(scene);
    ScenePrint(scene, warnings);
    return warnings.empty() ? STATUS_CLEAN : STATUS_WARNED;
}
