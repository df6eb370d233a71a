// SPDX-License-Identifier: MIT
#pragma once

#include "nurocore/types.h"

inline constexpr i32 MAJOR_UNKNOWN = -1;

// The major number that the kernel gave the partitionable md driver, by the block devices of
// /proc/devices; MAJOR_UNKNOWN when it is not there, or cannot be read. Nothing is logged, and the
// last-error record is left alone.
i32 MdpMajorRead();
