// SPDX-License-Identifier: MIT
//
// The first line is a key, the rest a line of a configuration file.
#include "nurocore/keyvalue.h"
#include "nurocore/text.h"

#include "conf.h"
#include "fuzz.h"

#include <cstring>

namespace
{

std::string TrimmedInPlace(std::string text)
{
    const int cch = NLIBCStrTrimSpace(text.data(), nullptr);
    Claim(cch >= 0 && static_cast<size_t>(cch) == strlen(text.c_str()), "the length is the text's");
    return text.c_str();
}

void TokensTell(const std::string &line)
{
    constexpr char DELIMITERS[] = " \t";
    const std::vector<std::string> expected = Words(line, DELIMITERS);
    PNLIBSZLIST pList = NLIBCSzListAlloc(128);
    const int nField = NLIBCStrTok(line.c_str(), DELIMITERS, &pList);
    Claim(nField == static_cast<int>(expected.size()), "as many fields");
    for (int i = 0; i < nField; i++) {
        Claim(NLIBCSzListGet(pList, i) == expected[static_cast<size_t>(i)], "the same fields");
    }
    NLIBCSzListFree(pList);
}

} // namespace

void Fuzz(std::string_view rest)
{
    const std::string key = CString(TakeUntil(rest, '\n'));
    const std::string line = CString(rest);

    const bool fMatch = NLIBCFileLineKeyMatch(line.c_str(), key.c_str()) == 1;
    Claim(fMatch == ConfKeyMatches(line, key), "the key matches or not");
    Claim(TrimmedInPlace(line) == Trimmed(line), "trimmed in place");
    std::string trimmed(line.size() + 1, '#');
    Claim(NLIBCStrTrimSpace(std::string(line).data(), trimmed.data()) >= 0 &&
              trimmed.c_str() == Trimmed(line),
          "trimmed into another buffer");
    TokensTell(line);
}
