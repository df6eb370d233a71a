// SPDX-License-Identifier: MIT
#pragma once

// The LVM stack on an array.

// Writes the path of the logical volume on a device, "/dev/<group>/<volume>", to szOut. With
// several, it is the one that LVM lists last. Returns 0, or -1 when there is none or it cannot be
// told (no code).
int LVMGetLVPath(const char *szDevice, char *szOut, int cbOut);

// Unmounts and removes the logical volume, its group and the physical volume on a device, best
// effort. Returns 0 when it was tried or there is none, -1 when it cannot even start: NULL, no
// mount table (no code).
int LVMRmLVPath(const char *szDevice);
