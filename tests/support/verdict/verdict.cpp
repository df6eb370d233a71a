// SPDX-License-Identifier: MIT
#include "verdict.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <fnmatch.h>
#include <sstream>
#include <thread>

namespace
{

constexpr double MILLISECONDS = 1000;

} // namespace

void VerdictTell(const std::string &szName, const std::string &szWrong, const std::string &szNote)
{
    std::string szText = (szWrong.empty() ? "ok " : "FAILED ") + szName;
    szText += (szNote.empty() ? "" : " # " + szNote) + "\n";
    std::istringstream lines(szWrong);
    for (std::string szLine; std::getline(lines, szLine);) {
        szText += "    " + szLine + "\n";
    }
    (void)fwrite(szText.data(), 1, szText.size(), stdout); // in one piece: workers share the output
    (void)fflush(stdout);
}

bool VerdictWanted(const std::string &szName, const std::string &szFilter)
{
    return szName.find(szFilter) != std::string::npos ||
           fnmatch(szFilter.c_str(), szName.c_str(), 0) == 0;
}

size_t VerdictWorkers()
{
    return std::max(std::thread::hardware_concurrency(), 1U);
}

int VerdictSilence()
{
    const char *const szShorter = getenv("ARRAYCTL_SILENCE");
    return static_cast<int>(atof(szShorter == nullptr ? VERDICT_SILENCE : szShorter) *
                            MILLISECONDS);
}
