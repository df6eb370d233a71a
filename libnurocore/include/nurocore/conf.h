// SPDX-License-Identifier: MIT
#pragma once

// What the appliance's model is like.

inline constexpr char NUROINFO_CONF_PATH[] = "/etc.defaults/nuroinfo.conf";

// 1 when the model's key says "yes" in any case; 0 for everything else: another value, no key, no
// file, NULL.
int NLIBCConfKeyIsYes(const char *szKey);

// The number of disks the model has; 0 when that is not known.
int NLIBCConfMaxDisksGet();

// The width of the system arrays: a key of its own, else the number of disks.
int NLIBCConfMaxSysRaidDisksGet();

// 1 on a machine with two heads, else 0. Asked once per process, and once per boot of the
// configuration: the answer is left behind as a marker file in /tmp.
int NLIBCConfSupportDualHead();
