// SPDX-License-Identifier: MIT
#pragma once

// What the configuration file says about the appliance's model.

inline constexpr char NUROINFO_CONF_PATH[] = "/etc.defaults/nuroinfo.conf";

// 1 when the model's key says "yes" in any case; 0 for everything else: another value, no key, no
// file, NULL.
int NLIBCConfKeyIsYes(const char *szKey);

// The number of disks the model has; 0 when that is not known.
int NLIBCConfMaxDisksGet();

// The width of the system arrays: a key of its own, else the number of disks.
int NLIBCConfMaxSysRaidDisksGet();

// 1 on a machine with two heads, else 0. The answer is kept for the life of the process, and in a
// marker file in /tmp until the next boot; the configuration file is read when there is neither.
int NLIBCConfSupportDualHead();
