// SPDX-License-Identifier: MIT
#pragma once

inline constexpr char MDADM_PATH[] = "/sbin/mdadm";
