// SPDX-License-Identifier: MIT
#pragma once

// Random machines that can be set up with real disks: the same seed gives the same one everywhere.

#include "oracle_machine.h"

#include <cstdint>
#include <map>
#include <string>
#include <vector>

struct PLAN_PARTITION {
    int number = 0;
    std::uint64_t start = 0;
    std::uint64_t size = 0;
    int type = 0;
};

struct PLAN_DISK {
    bool fGpt = false;
    std::vector<PLAN_PARTITION> table{};
    int nWholeMd = -1; // the array whose superblock is on the disk itself, below the table
};

// An array that real superblocks are made of. It may still run when the tool starts.
struct PLAN_ARRAY {
    int nMd = 0;
    std::string szMetadata{};
    std::string szName{}; // empty for the one that follows from the number
    std::vector<std::string> members{};
    bool fSpare = false;
    bool fRunning = false;
    int nLevel = 1;
    int nVolumes = 0;   // of the group on it; without one it has no group
    bool fFull = false; // no room is left beside the volumes
    bool fMounted = false;
};

// A call of a tool that fails without being passed on.
struct PLAN_FAULT {
    std::string szProgram{};
    std::string szPattern{}; // of the arguments, for the shell
    int nExit = 1;
    std::string szErr{};
};

struct PLAN {
    ORACLE_CASE subject{}; // without answers of tools: the real ones give those
    std::map<std::string, PLAN_DISK> disks{};
    std::vector<PLAN_ARRAY> arrays{};
    std::vector<PLAN_FAULT> faults{};
    bool fUnits = false; // the host adapters' folder has to be made up
    bool fRehearsed = false;
};

// With a rehearsal before the run no tool is made to fail: that could not be foreseen. One in four
// of these machines has an array to destroy, which the model knows nothing of.
PLAN PlanMake(std::uint64_t seed, bool fRehearsed);

bool PlanDestroys(const PLAN &plan);

// The plan in the words of the script that carries it out.
std::string PlanScript(const PLAN &plan);
