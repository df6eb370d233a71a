// SPDX-License-Identifier: MIT
//
// A program outside the tree: the members of an array, one a line, with their slots.
#include <cstdio>
#include <nurostoragecore/raid_disk.h>

int main(int argc, char **argv)
{
    RAID_DISK *pDisks = nullptr;
    if (argc != 2 || RAIDDiskListGet(argv[1], &pDisks) != 0) {
        (void)fputs("usage: members /dev/mdN\n", stderr);
        return 1;
    }
    for (const RAID_DISK *pDisk = pDisks; pDisk != nullptr; pDisk = pDisk->pNext) {
        printf("%s in slot %d\n", pDisk->szPath, pDisk->slot);
    }
    RAIDDiskListFree(pDisks);
    return 0;
}
