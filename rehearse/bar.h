// SPDX-License-Identifier: MIT
#pragma once

// A disk as a person sees it: which layout its first partitions have, and how it is divided.

#include "outcome.h"

// The version of the layout that the disk's partitions 1 and 2 have; empty when it is none.
std::string LayoutVersionText(const DISK &disk);

// The partitions to scale, as they are and as they would be: a digit each, and blanks between them.
std::string BarOf(const DISK &disk);
std::string BarOf(const DISK_OUTCOME &outcome);
