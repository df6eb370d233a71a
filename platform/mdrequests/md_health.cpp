// SPDX-License-Identifier: MIT
#include "md_health.h"

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <unistd.h>

namespace
{

enum class LOSS_RULE { NONE, ALL_BUT_ONE, FIXED, LAYOUT };

// How many members each level can lose and still return all of its data.
struct LEVEL_RULE {
    const char *szLevel;
    LOSS_RULE rule;
    int nLoss; // for FIXED
};

constexpr LEVEL_RULE LEVEL_RULES[] = {
    {"linear", LOSS_RULE::NONE, 0},       {"raid0", LOSS_RULE::NONE, 0},
    {"raid1", LOSS_RULE::ALL_BUT_ONE, 0}, {"multipath", LOSS_RULE::ALL_BUT_ONE, 0},
    {"raid4", LOSS_RULE::FIXED, 1},       {"raid5", LOSS_RULE::FIXED, 1},
    {"raid6", LOSS_RULE::FIXED, 2},       {"raid10", LOSS_RULE::LAYOUT, 0},
};

constexpr LEVEL_RULE UNKNOWN_LEVEL = {"", LOSS_RULE::NONE, 0};

// In these states the array may have members, but serves no data.
constexpr const char *STOPPED_STATES[] = {"", "clear", "inactive"};

// The values of sync_action while no thread works on the array. "frozen" holds work back on
// purpose.
constexpr const char *IDLE_ACTIONS[] = {"", "idle", "frozen"};

constexpr std::size_t PATH_SIZE = 256;

template <std::size_t N>
bool IsOneOf(const char *szWord, const char *const (&words)[N])
{
    return std::any_of(words, words + N,
                       [szWord](const char *sz) { return std::strcmp(sz, szWord) == 0; });
}

// During a reshape the driver writes "new (old)"; the first number is the one that counts.
int NumberGet(const char *szText)
{
    return static_cast<int>(std::clamp(std::strtol(szText, nullptr, 10), 0L, long{INT_MAX}));
}

int SlotCountGet(const MD_ATTRIBUTES *pAttributes)
{
    return std::min(NumberGet(pAttributes->szRaidDisks), MD_MAX_SLOTS);
}

const LEVEL_RULE &LevelRuleGet(const char *szLevel)
{
    for (const LEVEL_RULE &rule : LEVEL_RULES) {
        if (std::strcmp(rule.szLevel, szLevel) == 0) {
            return rule;
        }
    }
    return UNKNOWN_LEVEL;
}

// RAID10 tolerates the loss of any members as long as one copy of every chunk is left. Its layout
// holds the number of near copies in bits 0 to 7 and of far copies in bits 8 to 15, and the copies
// of a chunk lie on near x far neighbouring slots. Chunks start at every near-th slot, wrapping at
// the end when the number of slots is not a multiple of it; so it is enough to visit each of those
// starts once.
bool Raid10HoldsAllChunks(const MD_ATTRIBUTES *pAttributes)
{
    const int nSlots = SlotCountGet(pAttributes);
    const int layout = NumberGet(pAttributes->szLayout);
    const int nNear = std::max(layout & 0xFF, 1);
    const int nCopies = nNear * std::max((layout >> 8) & 0xFF, 1);

    if (nSlots == 0) {
        return true;
    }
    int first = 0;
    do {
        bool fHasCopy = false;
        for (int copy = 0; copy < nCopies; copy++) {
            fHasCopy |= pAttributes->fInSync[(first + copy) % nSlots];
        }
        if (!fHasCopy) {
            return false;
        }
        first = (first + nNear) % nSlots;
    } while (first != 0);
    return true;
}

bool BearsLoss(const MD_ATTRIBUTES *pAttributes, int nLost)
{
    const LEVEL_RULE &level = LevelRuleGet(pAttributes->szLevel);

    switch (level.rule) {
    case LOSS_RULE::NONE:
        return nLost == 0;
    case LOSS_RULE::ALL_BUT_ONE:
        return nLost < NumberGet(pAttributes->szRaidDisks);
    case LOSS_RULE::FIXED:
        return nLost <= level.nLoss;
    case LOSS_RULE::LAYOUT:
        return Raid10HoldsAllChunks(pAttributes);
    }
    return false;
}

// Levels without redundancy have no "degraded" file; their slots are counted.
int LostCountGet(const MD_ATTRIBUTES *pAttributes)
{
    if (pAttributes->szDegraded[0] != '\0') {
        return NumberGet(pAttributes->szDegraded);
    }
    const int nSlots = SlotCountGet(pAttributes);
    return static_cast<int>(std::count(pAttributes->fInSync, pAttributes->fInSync + nSlots, false));
}

// A resync_start that is a number is where a resync would continue: one is due, though no thread
// has begun it, as on an array that has not been written to since it was assembled.
bool IsResyncPending(const MD_ATTRIBUTES *pAttributes)
{
    return pAttributes->szSyncAction[0] != '\0' && pAttributes->szResyncStart[0] >= '0' &&
           pAttributes->szResyncStart[0] <= '9';
}

bool HasWord(const char *szText, const char *szWord)
{
    const std::size_t cbWord = std::strlen(szWord);

    while (*szText != '\0') {
        const std::size_t cbItem = std::strcspn(szText, ",\n");
        if (cbItem == cbWord && std::strncmp(szText, szWord, cbWord) == 0) {
            return true;
        }
        szText += cbItem;
        szText += std::strspn(szText, ",\n");
    }
    return false;
}

// Reads the first line of an attribute; an absent or unreadable file is an empty text.
bool AttributeRead(const char *szMdDir, const char *szName, char *szText, std::size_t cbText)
{
    char szPath[PATH_SIZE];

    szText[0] = '\0';
    if (std::snprintf(szPath, sizeof(szPath), "%s/%s", szMdDir, szName) >=
        static_cast<int>(sizeof(szPath))) {
        return false;
    }
    const int fd = open(szPath, O_RDONLY | O_CLOEXEC);
    if (fd < 0) {
        return false;
    }
    const ssize_t cbRead = read(fd, szText, cbText - 1);
    close(fd);
    szText[cbRead > 0 ? cbRead : 0] = '\0';
    szText[std::strcspn(szText, "\n")] = '\0';
    return cbRead > 0;
}

void SlotsRead(const char *szMdDir, MD_ATTRIBUTES *pAttributes)
{
    const int nSlots = SlotCountGet(pAttributes);

    std::fill_n(pAttributes->fInSync, MD_MAX_SLOTS, true);
    for (int slot = 0; slot < nSlots; slot++) {
        char szName[32];
        char szState[128];
        std::snprintf(szName, sizeof(szName), "rd%d/state", slot);
        pAttributes->fInSync[slot] =
            AttributeRead(szMdDir, szName, szState, sizeof(szState)) && MdMemberIsInSync(szState);
    }
}

bool StateRead(const char *szMdDir, MD_ATTRIBUTES *p)
{
    return AttributeRead(szMdDir, "array_state", p->szArrayState, sizeof(p->szArrayState));
}

} // namespace

int MdAttributesRead(const char *szMdDir, MD_ATTRIBUTES *p)
{
    *p = {};
    if (!StateRead(szMdDir, p)) {
        return -1;
    }
    AttributeRead(szMdDir, "level", p->szLevel, sizeof(p->szLevel));
    AttributeRead(szMdDir, "raid_disks", p->szRaidDisks, sizeof(p->szRaidDisks));
    AttributeRead(szMdDir, "layout", p->szLayout, sizeof(p->szLayout));
    AttributeRead(szMdDir, "degraded", p->szDegraded, sizeof(p->szDegraded));
    AttributeRead(szMdDir, "sync_action", p->szSyncAction, sizeof(p->szSyncAction));
    AttributeRead(szMdDir, "sync_completed", p->szSyncCompleted, sizeof(p->szSyncCompleted));
    AttributeRead(szMdDir, "resync_start", p->szResyncStart, sizeof(p->szResyncStart));
    SlotsRead(szMdDir, p);
    // If the array is stopped while it is read, empty texts remain, which look like a healthy
    // array. The state file appears before the others and disappears with them, so the state is
    // read again at the end.
    (void)StateRead(szMdDir, p);
    return 0;
}

bool MdIsRunning(const MD_ATTRIBUTES *pAttributes)
{
    return !IsOneOf(pAttributes->szArrayState, STOPPED_STATES);
}

bool MdMemberIsInSync(const char *szState)
{
    return HasWord(szState, "in_sync") && !HasWord(szState, "faulty");
}

std::int32_t MdHealthGet(const MD_ATTRIBUTES *pAttributes)
{
    const int nLost = LostCountGet(pAttributes);

    if (std::strcmp(pAttributes->szArrayState, "broken") == 0 || !BearsLoss(pAttributes, nLost)) {
        return MD_HEALTH_CRASHED;
    }
    return nLost == 0 ? MD_HEALTH_NORMAL : MD_HEALTH_DEGRADED;
}

MD_SYNC_STATUS MdSyncStatusGet(const MD_ATTRIBUTES *pAttributes)
{
    MD_SYNC_STATUS status = {};
    unsigned long long done = 0;
    unsigned long long total = 0;

    status.activity =
        !IsOneOf(pAttributes->szSyncAction, IDLE_ACTIONS) || IsResyncPending(pAttributes) ? 1 : 0;
    if (status.activity != 0 &&
        std::sscanf(pAttributes->szSyncCompleted, "%llu / %llu", &done, &total) == 2) {
        // The driver updates this number only every few seconds, starting from 0. A done of 0 would
        // mean that the resync is waiting, but a waiting one has no numbers at all.
        status.done = std::max(done, 1ULL);
        status.total = total;
    }
    return status;
}
