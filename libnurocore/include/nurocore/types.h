// SPDX-License-Identifier: MIT
#pragma once

// The fixed-width names that the whole tree uses.

#include <cstdint>
#include <ctime>
#include <sys/types.h>

using u8 = std::uint8_t;
using u32 = std::uint32_t;
using u64 = std::uint64_t;
using i32 = std::int32_t;
using i64 = std::int64_t;

static_assert(sizeof(off_t) == 8 && sizeof(time_t) == 8,
              "large disks and the year 2038 on 32-bit machines too");
