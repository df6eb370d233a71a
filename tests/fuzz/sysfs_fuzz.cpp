// SPDX-License-Identifier: MIT
//
// Two attributes, with a '|' between: "state" and "slot" of a member, "start" and "size" of a
// partition; the first one is the array's "sync_action" and "component_size", too.
#include "nurostoragecore/partition_layout.h"
#include "nurostoragecore/raid_disk.h"
#include "nurostoragecore/raid_info.h"

#include "fuzz.h"
#include "listing.h"

#include <fcntl.h>
#include <memory>
#include <sys/mman.h>

namespace
{

constexpr char MEMBER[] = "/sys/block/md0/md/dev-sda1";

bool Holds(const std::string &text, const char *szWord)
{
    return text.find(szWord) != std::string::npos;
}

u32 ModelState(std::string_view stateFile, std::string_view slotFile)
{
    const std::string state = FirstLine(stateFile, 32);
    if (Holds(state, "faulty")) {
        return DISK_STATE_FAILED;
    }
    if (!Holds(state, "write_error") && Holds(state, "error")) {
        return DISK_STATE_CRASHING;
    }
    if (Holds(state, "in_sync") || !Holds(state, "spare")) {
        return DISK_STATE_NORMAL;
    }
    return Holds(FirstLine(slotFile, 32), "none") ? DISK_STATE_SPARE : DISK_STATE_REBUILDING;
}

void MemberTells(std::string_view state, std::string_view slot)
{
    OutsideClear();
    OutsideFile("/sys/block/md0/md/dev-sda1/state", state);
    OutsideFile("/sys/block/md0/md/dev-sda1/slot", slot);
    RAID_DISK *pDisk = nullptr;
    const int result = RAIDDiskCreate(MEMBER, &pDisk);
    Claim(result == (state.empty() || slot.empty() ? -1 : 0), "a member or none");
    if (result == 0) {
        std::string number = FirstLine(slot, 64);
        number = number.substr(0, number.find('\n'));
        Claim(pDisk->state == ModelState(state, slot), "the member's state");
        Claim(pDisk->slot == (number == "none" ? -1 : Number32(number)), "its slot");
    }
    RAIDDiskListFree(pDisk);
}

void SyncActionTells(std::string_view file)
{
    constexpr std::string_view WORDS[] = {"idle",  "frozen", "reshape", "resync",
                                          "check", "repair", "recover"};
    OutsideClear();
    OutsideFile("/sys/block/md0/md/sync_action", file);
    int action = -1;
    const int result = RAIDSyncActionGet(0, &action);
    std::string text = FirstLine(file, 128);
    text = text.substr(0, text.empty() ? 0 : text.size() - 1);
    int expected = -1;
    for (int i = 0; i < 7 && expected < 0 && !file.empty(); i++) {
        expected = WORDS[i].starts_with(text) ? i : -1;
    }
    Claim(result == (expected < 0 ? -1 : 0) && action == expected, "the action");
}

void ComponentSizeTells(std::string_view file)
{
    static const int fdDevice = memfd_create("md0", MFD_CLOEXEC); // its device number is 0
    OutsideClear();
    OutsideFile("/sys/block/md0/md/component_size", file);
    const u64 nSectors = RAIDComponentSizeGet(fdDevice);
    const u64 expected = file.size() >= 50 ? 0 : strtoull(CString(file).c_str(), nullptr, 10) * 2;
    Claim(nSectors == expected, "the size of a member");
}

void StartSizeTells(std::string_view startFile, std::string_view sizeFile)
{
    OutsideClear();
    OutsideFile("/sys/block/sda/sda1/start", startFile);
    OutsideFile("/sys/block/sda/sda1/size", sizeFile);
    u64 start = 0;
    u64 size = 0;
    const int result = PartitionStartSizeGet("/dev/sda", 1, &start, &size);
    const auto expectedStart = SectorsRead(startFile);
    const auto expectedSize = SectorsRead(sizeFile);
    Claim(result == (expectedStart && expectedSize ? 1 : -1), "two numbers or a failure");
    Claim(result != 1 || (start == *expectedStart && size == *expectedSize), "start and size");
}

} // namespace

void Fuzz(std::string_view rest)
{
    const std::string_view first = TakeUntil(rest, '|');
    MemberTells(first, rest);
    SyncActionTells(first);
    ComponentSizeTells(first);
    StartSizeTells(first, rest);
}
