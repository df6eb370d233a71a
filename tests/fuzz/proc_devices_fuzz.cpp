// SPDX-License-Identifier: MIT
//
// The input is /proc/devices.
#include "raid/mdp_major.h"

#include "fuzz.h"

#include <algorithm>

void Fuzz(std::string_view file)
{
    OutsideFile("/proc/devices", file);
    const i32 number = MdpMajorRead();
    Claim(number >= MAJOR_UNKNOWN, "a major number or none");

    std::string bare(file);
    std::erase_if(bare, [](char ch) { return ch == '"' || ch == '\''; });
    const size_t section = bare.find("devices:", std::min(bare.find("Block"), bare.size()));
    const bool fWords = bare.find("mdp", std::min(section, bare.size())) != std::string::npos;
    Claim(fWords || number == MAJOR_UNKNOWN, "no number without the words");
}
