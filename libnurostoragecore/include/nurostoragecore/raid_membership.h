// SPDX-License-Identifier: MIT
#pragma once

// Whether a disk or an array is in use.

// The number of the array that a device's superblock names. Returns 1 with the number, 0 without
// a superblock (one that cannot be read counts as none), -1 for NULL or a bad array path (no code).
int RAIDDiskSuperblockMdGet(const char *szDevice, int *pMd);

// Whether some array uses the disk. Returns 1 with the array's number in *pMd (may be NULL), 0 for
// a free disk, -1 for NULL (no code).
int RAIDDiskIsUsedByRAID(const char *szDisk, int *pMd);

// Whether the array is running. Returns 1, or -1: ERR_BAD_PARAMETER, ERR_OPEN_FAILED, or the code
// of the request. 0 is reserved for an absent array and never returned, see RAIDInfoGet.
int RAIDIsDetected(const char *szMd);
