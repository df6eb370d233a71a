// SPDX-License-Identifier: MIT
#pragma once

// How a run with failing calls may differ from the undisturbed one on the same machine, and why.
//
// The tool works on with what it can learn: a question without an answer has a fixed answer, and a
// step that fails has a fixed consequence. Scripts count on both, so they are kept; what they lead
// to is listed here, the unpleasant cases first. A difference that no row allows fails the suite.

enum class DIFFERENCE {
    OTHER_DISK,    // a change of a disk or array that the undisturbed run leaves alone
    EXTRA_CHANGE,  // another change of what that run changes, too
    EXTRA_QUERY,   // a question that it does not ask
    LEFT_CHILDREN, // no text
    ANSWER,        // an answer that says success and is not the undisturbed one: the text is it
    ABORT,         // the text is what stands on standard error
};

struct ALLOWANCE {
    DIFFERENCE difference;
    const char *szSituation;
    const char *szFault; // "FUNCTION N PROCESS OBJECT" of one of the failed calls
    const char *szText;
    const char *szReason;
};

// What a look into the configuration file consists of, without and with the memory it takes.
#define ALLOCATION "^(malloc|calloc|realloc|strndup|strdup|\\*) "
#define CONF_LOOK "nuroinfo\\.conf|dualhead|" ALLOCATION
#define UNIT_LOOK "nuro_pm_info|^scandir |" ALLOCATION
// What a child that looks after one disk does, and how it is waited for.
#define CHILD_WORK "^[a-z0-9_]+ [0-9]+ 0\\.|^waitpid "
#define DISK_LOOK "/sys/|^(pipe2|fork|fdopen|execv|dup2|fgets|waitpid|open) |" CONF_LOOK

inline constexpr ALLOWANCE ALLOWANCES[] = {
    {DIFFERENCE::OTHER_DISK, "^(initsys|newvol): an expansion unit", CONF_LOOK,
     " /dev/sd[ab][123]?( |$)",
     "WIPES: whether the machine is dual-head cannot be read, so it is not, and the internal "
     "disks are taken instead of the expansion unit's"},
    {DIFFERENCE::OTHER_DISK, "^(initsys|newvol): an expansion unit", UNIT_LOOK,
     "mdadm -C /dev/md[012] .* /dev/sdg[abc][123]",
     "disks that the expansion unit cannot tell of are not in it; the others are used"},
    {DIFFERENCE::OTHER_DISK, "^newvol: an expansion unit of which two", CONF_LOOK,
     " /dev/sdgc3?( |$)",
     "WIPES: a limit of disks that cannot be read is 12, so more disks are taken"},
    {DIFFERENCE::OTHER_DISK,
     "^newvol: (an expansion unit of which two|a partition that cannot be made)",
     CONF_LOOK "|" UNIT_LOOK, " /dev/sd(gc|b)3?( |$)",
     "a disk whose port cannot be known is passed over, and the next one is taken"},
    {DIFFERENCE::OTHER_DISK,
     "^initsys: (an old disk in an array|the biggest layout|a disk that nobody knows)", DISK_LOOK,
     "fast-delete -1 ",
     "WIPES: a disk of another layout counts as free when its superblock cannot be examined, and "
     "as blank when the partitioner cannot be asked"},
    {DIFFERENCE::OTHER_DISK, "^initsys: (an old disk in an array|the biggest layout)", DISK_LOOK,
     "fast-delete 1:2 ",
     "RENEWS: a disk whose layout cannot be read has none, and gets new system partitions as "
     "long as no other disk keeps its data"},
    {DIFFERENCE::OTHER_DISK, "^initsys: (an old disk in an array|the biggest layout)", DISK_LOOK,
     "^/sbin/(sfdisk (-M1|-N[12]) |mdadm -C /dev/md[01] )",
     "what follows on a disk that was wiped or renewed for one of these reasons"},
    {DIFFERENCE::OTHER_DISK, "^initsys: a disk that nobody knows is left alone", DISK_LOOK,
     "^/sbin/(sfdisk (--fast-delete 1:2|-M1|-N[12]) |mdadm -C /dev/md[01] )",
     "RENEWS: when the only disk that keeps its data is not known as one, the disks without a "
     "known layout get new system partitions"},
    {DIFFERENCE::OTHER_DISK, "^destroy: a stop that fails", "^(waitpid|\\*) ",
     "^/sbin/mdadm --zero-superblock ",
     "WIPES: a tool that somebody else has waited for counts as one that worked; so the "
     "superblocks go although the array still runs"},
    {DIFFERENCE::OTHER_DISK, "^newvol: a partition that cannot be made", "^(waitpid|\\*) ", "",
     "a tool that somebody else has waited for counts as one that worked"},
    {DIFFERENCE::OTHER_DISK, "^destroy: volumes that cannot", "^(fgets|\\*) .* pipe$",
     "^/sbin/(lvremove|vgremove) ",
     "the last row that names the array counts; rows after a failed read are not there"},

    {DIFFERENCE::EXTRA_CHANGE, "^initsys", CHILD_WORK "|" CONF_LOOK "|" UNIT_LOOK,
     "^(/sbin/mdadm -C /dev/md[01] |/bin/nurodd)",
     "a disk whose child has failed is left out of the arrays, and its place stays missing"},
    {DIFFERENCE::EXTRA_CHANGE, "^(initsys|newvol)", CONF_LOOK, " -t8[23] ",
     "whether the machine has RAID cannot be read, so it has not, and partitions get the other "
     "types"},
    {DIFFERENCE::EXTRA_CHANGE, "^initsys", CONF_LOOK,
     "^/sbin/mdadm --zero-superblock /dev/sd[a-z]+[12]$",
     "a number of slots that cannot be read is 0 (or that of all disks), and disks without a "
     "slot lose the superblocks of their new partitions"},
    {DIFFERENCE::EXTRA_CHANGE, "^initsys", DISK_LOOK, "fast-delete -1 ",
     "WIPES: a disk counts as blank when the partitioner cannot be asked for either partition, "
     "and as free when its superblock cannot be examined"},
    {DIFFERENCE::EXTRA_CHANGE, "^initsys: all disks are to be wiped", "^(access|\\*) .*force_clean",
     "^/sbin/sfdisk --fast-delete 1:2 ", "a marker that cannot be seen is not there"},
    {DIFFERENCE::EXTRA_CHANGE, "^initsys: the biggest layout", DISK_LOOK, "^/sbin/sfdisk -N[12] ",
     "a disk that cannot be looked at has no part in the choice of the layout"},
    {DIFFERENCE::EXTRA_CHANGE, "^initsys: an old disk in an array",
     "^(glob|fopen|fgets|access) |/sys/|" CONF_LOOK, "^/sbin/sfdisk -N[12] ",
     "WIPES: a system array whose members cannot be listed is not there, and the layout of "
     "another disk is chosen"},
    {DIFFERENCE::EXTRA_CHANGE, "^initsys: a disk that cannot be partitioned", "^(waitpid|\\*) ",
     "^/sbin/sfdisk -N2 ", "a tool that somebody else has waited for counts as one that worked"},
    {DIFFERENCE::EXTRA_CHANGE, "^newvol", "^(access|\\*) .*/tmp/raid\\.",
     "^/sbin/mdadm -C /dev/md2 ", "a marker that cannot be seen is not there"},
    {DIFFERENCE::EXTRA_CHANGE, "^newvol", CONF_LOOK "|" UNIT_LOOK, "^/sbin/mdadm -C /dev/md2 ",
     "the array is made of the disks that are known, at the level that fits their number"},
    {DIFFERENCE::EXTRA_CHANGE, "^destroy", "", "^/sbin/mdadm -S /dev/md2$",
     "a stop of which nobody knows that it worked is tried again"},

    {DIFFERENCE::EXTRA_QUERY, "^destroy", "dev-sd|" ALLOCATION, "^/sbin/mdadm -E ",
     "the array's UUID is asked of the first member that can be read"},
    {DIFFERENCE::EXTRA_QUERY, "^destroy: a stop that fails", "^(waitpid|\\*) ", "^/sbin/mdadm -E ",
     "a tool that somebody else has waited for counts as one that worked"},
    {DIFFERENCE::EXTRA_QUERY, "^(initsys|enum)", "", "^/sbin/(sfdisk -l|mdadm -E) ",
     "a disk that cannot be looked at in one way is looked at in another"},

    {DIFFERENCE::LEFT_CHILDREN, "^(initsys|enum)", "^(fork|\\*) ", "",
     "a failed fork ends the command at once: the children of the disks before are not waited for"},
    {DIFFERENCE::LEFT_CHILDREN, "", "^(fdopen|malloc|\\*) ", "",
     "a pipe that cannot become a stream is closed, and its tool is not waited for"},
    {DIFFERENCE::LEFT_CHILDREN, "", "^waitpid ", "",
     "a child that cannot be waited for is given up"},

    {DIFFERENCE::ANSWER, "^status", "dev-sd|" ALLOCATION, "",
     "a member whose attributes cannot be read is left out of the report"},
    {DIFFERENCE::ANSWER, "^enum", CHILD_WORK "|" CONF_LOOK "|" UNIT_LOOK "|/sys/|pipe$", "",
     "a disk whose decision is lost is none that keeps its data, and without one all are listed; "
     "a disk whose port is not known is not listed"},
    {DIFFERENCE::ANSWER, "^newvol", "/tmp/raid\\.|^waitpid |" CONF_LOOK "|" UNIT_LOOK, "",
     "the array is made of the disks that are known, at the level that fits their number"},

    {DIFFERENCE::ABORT, "", "^(malloc|\\*) ",
     "^(free\\(\\): double free detected in tcache 2|double free or corruption \\(fasttop\\))\n$|"
     "attempting double-free .* in __glob|"
     "attempting double-free [^\n]*\n +#0 [^\n]*\n +#1 [^\n]*/libc\\.so\\.6", // without names
     "ABORTS: the C library's glob frees names twice when memory ends while it puts the folder "
     "before them"},
};
