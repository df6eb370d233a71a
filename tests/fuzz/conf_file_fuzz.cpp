// SPDX-License-Identifier: MIT
//
// The input is the configuration file of the model.
#include "nurocore/conf.h"
#include "nurocore/file.h"
#include "nurocore/keyvalue.h"

#include "conf_model.h"
#include "outside.h"

#include <algorithm>
#include <strings.h>
#include <vector>

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
    const MODEL_LOOKUP expected = ModelLookup(file, szKey, cbValue, flags == KEYVALUE_LAST_MATCH);
    Claim(result == expected.result, "the lookup's result");
    Claim(value.back() == UNTOUCHED, "nothing behind the buffer");
    if (cbValue > 0 && result > 0 && value.front() != UNTOUCHED) {
        Claim(expected.text == value.data(), "the value");
    }
}

void AnswersTell(std::string_view file)
{
    const MODEL_LOOKUP raid = ModelLookup(file, "supportraid", 5, false);
    const bool fYes = raid.result > 0 && strcasecmp(raid.text.c_str(), "yes") == 0;
    Claim(NLIBCConfKeyIsYes("supportraid") == (fYes ? 1 : 0), "yes or no");
    Claim(ModelLookup(file, "maxdisks", 64, false).result > 0 || NLIBCConfMaxDisksGet() == 0,
          "no count without its key");
    (void)NLIBCConfMaxSysRaidDisksGet();
    const int checked = NLIBCFileCheckKeyValue(NUROINFO_CONF_PATH, "no_disk_swap", "yes", 1);
    Claim(checked == 0 || checked == 1, "a check is yes or no");
}

void LinesTell(std::string_view file)
{
    PNLIBSZLIST pLines = NLIBCSzListAlloc(1024);
    Claim(NLIBCFileReadLines(NUROINFO_CONF_PATH, &pLines) == 0, "every line is read");
    int index = 0;
    ForEachLine(file, 1024, [&](const std::string &line) {
        const char *const szLine = NLIBCSzListGet(pLines, index++);
        Claim(szLine != nullptr && szLine == line, "the same lines");
        return true;
    });
    Claim(pLines->nItem == index, "as many lines");
    NLIBCSzListFree(pLines);
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *pInput, size_t cbInput)
{
    const std::string_view file = InputText(pInput, cbInput);
    OutsideClear();
    OutsideFile(NUROINFO_CONF_PATH, file);
    const int cbValue = BUFFER_SIZES[file.size() % std::size(BUFFER_SIZES)];
    LookupTells(file, "maxdisks", cbValue, KEYVALUE_FIRST_MATCH);
    LookupTells(file, "usbportcfg", cbValue, KEYVALUE_LAST_MATCH);
    AnswersTell(file);
    LinesTell(file);
    return 0;
}
