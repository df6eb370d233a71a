// SPDX-License-Identifier: MIT
//
// The input is the configuration file of the model.
#include "nurocore/conf.h"
#include "nurocore/file.h"
#include "nurocore/keyvalue.h"

#include "conf.h"
#include "fuzz.h"

#include <algorithm>

namespace
{

constexpr char UNTOUCHED = '\x7f';
constexpr int BUFFER_SIZES[] = {-1, 0, 1, 5, 64, 512}; // -1 measures

void LookupTells(std::string_view file, const char *szKey, int cbValue, int flags)
{
    const bool fMeasure = cbValue < 0;
    std::vector<char> value(static_cast<size_t>(std::max(cbValue, 0)) + 1, UNTOUCHED);
    const int result = NLIBCFileGetKeyValue(
        NUROINFO_CONF_PATH, szKey, fMeasure ? nullptr : value.data(), std::max(cbValue, 0), flags);
    const CONF_LOOKUP expected = ConfLookup(file, szKey, cbValue, flags == KEYVALUE_LAST_MATCH);
    Claim(result == expected.result, "the lookup's result");
    Claim(value.back() == UNTOUCHED, "nothing behind the buffer");
    if (cbValue > 0 && result > 0 && value.front() != UNTOUCHED) {
        Claim(expected.text == value.data(), "the value");
    }
}

void AnswersTell(std::string_view file)
{
    const bool fRaid = ConfLookup(file, "supportraid", 5).IsYes();
    Claim(NLIBCConfKeyIsYes("supportraid") == (fRaid ? 1 : 0), "yes or no");
    const CONF_LOOKUP disks = ConfLookup(file, "maxdisks", 64);
    const int nDisks = disks.result > 0 ? Number32(disks.text) : 0;
    Claim(NLIBCConfMaxDisksGet() == nDisks, "the number of disks");
    const CONF_LOOKUP slots = ConfLookup(file, "max_sys_raid_disks", 64);
    const int nSlots = slots.result > 0 ? Number32(slots.text) : nDisks;
    Claim(NLIBCConfMaxSysRaidDisksGet() == nSlots, "the number of slots");
    const int checked = NLIBCFileCheckKeyValue(NUROINFO_CONF_PATH, "no_disk_swap", "yes", 1);
    Claim(checked == 0 || checked == 1, "a check is yes or no");
}

void LinesTell(std::string_view file)
{
    PNLIBSZLIST pLines = NLIBCSzListAlloc(1024);
    Claim(NLIBCFileReadLines(NUROINFO_CONF_PATH, &pLines) == 0, "every line is read");
    int index = 0;
    for (const std::string &line : Lines(file, 1024)) {
        const char *const szLine = NLIBCSzListGet(pLines, index++);
        Claim(szLine != nullptr && szLine == line, "the same lines");
    }
    Claim(pLines->nItem == index, "as many lines");
    NLIBCSzListFree(pLines);
}

} // namespace

void Fuzz(std::string_view file)
{
    OutsideFile(NUROINFO_CONF_PATH, file);
    const int cbValue = BUFFER_SIZES[file.size() % std::size(BUFFER_SIZES)];
    LookupTells(file, "maxdisks", cbValue, KEYVALUE_FIRST_MATCH);
    LookupTells(file, "usbportcfg", cbValue, KEYVALUE_LAST_MATCH);
    AnswersTell(file);
    LinesTell(file);
}
