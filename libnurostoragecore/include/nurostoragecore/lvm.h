// SPDX-License-Identifier: MIT
#pragma once

// The LVM stack on an array.

// Writes the path of the logical volume on a device, "/dev/<group>/<volume>", to szOut. If there
// are several, it is the one that LVM lists last. Returns 0, or -1 when there is none or it cannot
// be determined (no code).
int LVMGetLVPath(const char *szDevice, char *szOut, int cbOut);

// Unmounts and removes the logical volume, its group and the physical volume on a device, best
// effort. Returns 0 when this was attempted or there is no volume, -1 (no code) for NULL or when
// the mount table cannot be opened.
int LVMRmLVPath(const char *szDevice);
