// SPDX-License-Identifier: MIT
#include "options.h"
#include "partition.h"

#include <cctype>
#include <cerrno>
#include <climits>
#include <cstdint>
#include <cstdlib>
#include <cstring>

namespace
{

enum OPTION_BIT : unsigned {
    OPTION_SIGN = 1U << 0,
    OPTION_DELETE = 1U << 1,
    OPTION_LIST = 1U << 2,
    OPTION_NUMBER = 1U << 3,
    OPTION_UNIT = 1U << 4,
    OPTION_SKIP = 1U << 5,
    OPTION_SIZE = 1U << 6,
    OPTION_TYPE = 1U << 7,
    OPTION_QUIET = 1U << 8,
    OPTION_FORCE = 1U << 9,
    OPTION_FLUSH = 1U << 10,
};

enum OPTION_VALUE {
    VALUE_NONE,
    VALUE_ATTACHED,
    VALUE_NEXT,
};

struct OPTION {
    const char *szName;
    unsigned bit;
    OPTION_VALUE value;
    bool (*pfnRead)(const char *szValue, REQUEST *pRequest);
};

struct COMMAND_RULE {
    COMMAND command;
    unsigned needed;
    unsigned allowed;
};

// Accepts only digits of the base: no sign, no blank, no 0x, and no overflow.
bool NumberRead(const char *szText, int base, u64 max, u64 *pValue)
{
    if (!isxdigit(static_cast<unsigned char>(szText[0])) || strpbrk(szText, "xX")) {
        return false;
    }
    char *pEnd = nullptr;
    errno = 0;
    const u64 value = strtoull(szText, &pEnd, base);
    if (errno != 0 || *pEnd != '\0' || value > max) {
        return false;
    }
    *pValue = value;
    return true;
}

bool PartitionNumberRead(const char *szText, int *pNumber)
{
    u64 value = 0;
    if (!NumberRead(szText, 10, INT_MAX, &value) || value == 0) {
        return false;
    }
    *pNumber = static_cast<int>(value);
    return true;
}

bool OptionNumberRead(const char *szValue, REQUEST *pRequest)
{
    return PartitionNumberRead(szValue, &pRequest->number);
}

bool OptionSkipRead(const char *szValue, REQUEST *pRequest)
{
    return NumberRead(szValue, 10, UINT64_MAX, &pRequest->skip);
}

bool OptionSizeRead(const char *szValue, REQUEST *pRequest)
{
    if (strcmp(szValue, "-1") == 0) {
        pRequest->sectors = SIZE_REST_OF_DISK;
        return true;
    }
    return NumberRead(szValue, 10, SIZE_REST_OF_DISK - 1, &pRequest->sectors) &&
           pRequest->sectors != 0;
}

// Types that are not data partitions: an empty slot, extended partitions, a protective entry.
bool OptionTypeRead(const char *szValue, REQUEST *pRequest)
{
    constexpr u32 TYPES_REFUSED[] = {0x00, 0x05, 0x0f, 0x85, 0xee};

    u64 value = 0;
    if (!NumberRead(szValue, 16, 0xff, &value)) {
        return false;
    }
    for (const u32 refused : TYPES_REFUSED) {
        if (value == refused) {
            return false;
        }
    }
    pRequest->type = static_cast<u32>(value);
    return true;
}

bool OptionRangeRead(const char *szValue, REQUEST *pRequest)
{
    if (strcmp(szValue, "-1") == 0) {
        pRequest->firstDeleted = 1;
        pRequest->lastDeleted = INT_MAX;
        return true;
    }
    char szFirst[16];
    const size_t cbFirst = strcspn(szValue, ":");
    if (szValue[cbFirst] != ':' || cbFirst >= sizeof(szFirst)) {
        return false;
    }
    memcpy(szFirst, szValue, cbFirst);
    szFirst[cbFirst] = '\0';
    return PartitionNumberRead(szFirst, &pRequest->firstDeleted) &&
           PartitionNumberRead(szValue + cbFirst + 1, &pRequest->lastDeleted) &&
           pRequest->firstDeleted <= pRequest->lastDeleted;
}

// -q, -f and -F are accepted without effect: this program prints nothing but failures, asks
// nothing, and always has its changes on the disk before it ends.
constexpr OPTION OPTIONS[] = {
    {"-M1", OPTION_SIGN, VALUE_NONE, nullptr},
    {"--fast-delete", OPTION_DELETE, VALUE_NEXT, OptionRangeRead},
    {"-l", OPTION_LIST, VALUE_NONE, nullptr},
    {"-N", OPTION_NUMBER, VALUE_ATTACHED, OptionNumberRead},
    {"-uS", OPTION_UNIT, VALUE_NONE, nullptr},
    {"-j", OPTION_SKIP, VALUE_ATTACHED, OptionSkipRead},
    {"-z", OPTION_SIZE, VALUE_ATTACHED, OptionSizeRead},
    {"-t", OPTION_TYPE, VALUE_ATTACHED, OptionTypeRead},
    {"-q", OPTION_QUIET, VALUE_NONE, nullptr},
    {"-f", OPTION_FORCE, VALUE_NONE, nullptr},
    {"-F", OPTION_FLUSH, VALUE_NONE, nullptr},
};

constexpr unsigned CREATE_NEEDS =
    OPTION_NUMBER | OPTION_UNIT | OPTION_SKIP | OPTION_SIZE | OPTION_TYPE;
constexpr unsigned LIST_NEEDS = OPTION_LIST | OPTION_UNIT | OPTION_NUMBER;

constexpr COMMAND_RULE COMMAND_RULES[] = {
    {COMMAND_SIGN, OPTION_SIGN, OPTION_SIGN},
    {COMMAND_CREATE, CREATE_NEEDS, CREATE_NEEDS | OPTION_QUIET | OPTION_FORCE | OPTION_FLUSH},
    {COMMAND_DELETE, OPTION_DELETE, OPTION_DELETE},
    {COMMAND_LIST, LIST_NEEDS, LIST_NEEDS},
};

const OPTION *OptionFind(const char *szWord)
{
    for (const OPTION &option : OPTIONS) {
        const bool fMatch = option.value == VALUE_ATTACHED
                                ? strncmp(szWord, option.szName, strlen(option.szName)) == 0
                                : strcmp(szWord, option.szName) == 0;
        if (fMatch) {
            return &option;
        }
    }
    return nullptr;
}

// Takes the option at *pArg, and the word behind it when the option needs one.
int OptionTake(int argc, char **argv, int *pArg, unsigned *pSeen, REQUEST *pRequest)
{
    const char *szWord = argv[*pArg];
    const OPTION *pOption = OptionFind(szWord);
    if (!pOption) {
        return Complain("unknown option '%s'", szWord);
    }
    if (*pSeen & pOption->bit) {
        return Complain("option '%s' is given twice", pOption->szName);
    }
    *pSeen |= pOption->bit;
    if (pOption->value == VALUE_NONE) {
        return 0;
    }
    const char *szValue = szWord + strlen(pOption->szName);
    if (pOption->value == VALUE_NEXT) {
        szValue = ++*pArg < argc ? argv[*pArg] : "";
    }
    if (!pOption->pfnRead(szValue, pRequest)) {
        return Complain("bad value '%s' of option '%s'", szValue, pOption->szName);
    }
    return 0;
}

int CommandChoose(unsigned seen, COMMAND *pCommand)
{
    for (const COMMAND_RULE &rule : COMMAND_RULES) {
        if ((seen & rule.needed) == rule.needed && (seen & ~rule.allowed) == 0) {
            *pCommand = rule.command;
            return 0;
        }
    }
    return Complain("these options make no command");
}

} // namespace

int RequestRead(int argc, char **argv, REQUEST *pRequest)
{
    unsigned seen = 0;

    *pRequest = {};
    for (int i = 1; i < argc; i++) {
        const char *szWord = argv[i];
        if (szWord[0] == '\0') {
            continue;
        }
        if (szWord[0] == '-') {
            if (OptionTake(argc, argv, &i, &seen, pRequest) != 0) {
                return 1;
            }
            continue;
        }
        if (pRequest->szDisk) {
            return Complain("more than one disk: '%s' and '%s'", pRequest->szDisk, szWord);
        }
        pRequest->szDisk = szWord;
    }
    if (CommandChoose(seen, &pRequest->command) != 0) {
        return 1;
    }
    return pRequest->szDisk ? 0 : Complain("no disk is named");
}
