// SPDX-License-Identifier: MIT
#pragma once

// MBR type codes of the partitions.

#include "nurocore/types.h"

constexpr u32 TYPE_LINUX = 0x83;
constexpr u32 TYPE_SWAP = 0x82;
constexpr u32 TYPE_RAID = 0xfd;
