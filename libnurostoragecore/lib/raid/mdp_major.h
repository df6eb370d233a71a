// SPDX-License-Identifier: MIT
#pragma once

#include "nurocore/types.h"

inline constexpr i32 MAJOR_UNKNOWN = -1;

// The major number of the partitionable md driver among the block devices of /proc/devices;
// MAJOR_UNKNOWN when it is not listed or the file cannot be read. Nothing is logged, and the
// last-error record is not changed.
i32 MdpMajorRead();
