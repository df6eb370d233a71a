// SPDX-License-Identifier: MIT
#pragma once

// The fixed-width names that the whole tree uses.

#include <cstdint>

using u8 = std::uint8_t;
using u32 = std::uint32_t;
using u64 = std::uint64_t;
using i32 = std::int32_t;
using i64 = std::int64_t;
