// SPDX-License-Identifier: MIT
#include "oracle_strands.h"

#include <algorithm>

namespace
{

using std::string;

// The words of these machines need no quotes but for an empty one.
string LineOf(const ORACLE_WORDS &words)
{
    string szLine;
    for (const string &szWord : words) {
        szLine += (szLine.empty() ? "" : " ") + (szWord.empty() ? "''" : szWord);
    }
    return szLine + '\n';
}

// The disk of a command that is one disk's.
string DiskOf(const string &szLine)
{
    const size_t iDisk = szLine.find("/dev/sd");
    const bool fOne = iDisk != string::npos && szLine.find("/dev/", iDisk + 1) == string::npos &&
                      szLine.find(" -C ") == string::npos;
    if (!fOne) {
        return "";
    }
    const string szPath = szLine.substr(iDisk, szLine.find_first_of(" \n", iDisk) - iDisk);
    return szPath.substr(0, szPath.find_first_of("0123456789"));
}

string StrandsText(const ORACLE_STRANDS &strands)
{
    string text;
    for (const auto &[szDisk, szLines] : strands) {
        text += "    # " + (szDisk.empty() ? "all" : szDisk) + '\n' + szLines;
    }
    return text;
}

} // namespace

bool OracleIsQuestion(const ORACLE_WORDS &words)
{
    return words.size() > 1 && (words[1] == "-E" || words[1] == "-l" || words[0] == "/sbin/pvs");
}

ORACLE_STRANDS OracleStrandsRun(const std::vector<ORACLE_WORDS> &calls)
{
    ORACLE_STRANDS strands;
    for (const ORACLE_WORDS &words : calls) {
        if (!OracleIsQuestion(words) && words[0] != "sleep") {
            const string szLine = LineOf(words);
            strands[DiskOf(szLine)] += szLine;
        }
    }
    return strands;
}

ORACLE_STRANDS OracleStrandsRehearsed(const std::string &szLines)
{
    ORACLE_STRANDS strands;
    for (size_t iStart = 0; iStart < szLines.size();) {
        const size_t iEnd = std::min(szLines.find('\n', iStart), szLines.size() - 1) + 1;
        const string szLine = szLines.substr(iStart, iEnd - iStart);
        strands[DiskOf(szLine)] += szLine;
        iStart = iEnd;
    }
    return strands;
}

std::string OracleStrandsDifference(const ORACLE_STRANDS &rehearsed, const ORACLE_STRANDS &run)
{
    return rehearsed == run
               ? ""
               : "it told of\n" + StrandsText(rehearsed) + "the tool ran\n" + StrandsText(run);
}
