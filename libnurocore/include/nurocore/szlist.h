// SPDX-License-Identifier: MIT
#pragma once

// The list of strings with all that it can do.

// IWYU pragma: begin_exports
#include "nurocore/szlist_base.h"
#include "nurocore/szlist_join.h"
#include "nurocore/szlist_merge.h"
// IWYU pragma: end_exports
