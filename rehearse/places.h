// SPDX-License-Identifier: MIT
#pragma once

#include <cstddef>

// What a rehearsal has at fixed places. All of them lie on file systems that only its own mount
// namespace knows, and that end with it.

inline constexpr char PROGRAM_NAME[] = "arrayctl-rehearse";

inline constexpr char TMP_FOLDER[] = "/tmp";
inline constexpr char LOG_FOLDER[] = "/var/log";
inline constexpr char SYSLOG_PATH[] = "/dev/log";

inline constexpr char PRIVATE_FOLDER[] = "/tmp/.arrayctl-rehearse";
inline constexpr char RECORDER_PATH[] = "/tmp/.arrayctl-rehearse/recorder";
inline constexpr char REAL_FOLDER[] = "/tmp/.arrayctl-rehearse/real";
inline constexpr char REAL_SHELL_PATH[] = "/tmp/.arrayctl-rehearse/shell";
inline constexpr char TOOL_PATH[] = "/tmp/.arrayctl-rehearse/tool";
inline constexpr char JOURNAL_PATH[] = "/tmp/.arrayctl-rehearse/journal";
inline constexpr char LOG_SOCKET_PATH[] = "/tmp/.arrayctl-rehearse/log";

// The programs that the tool runs. The recorder stands in the place of each that exists.
struct PROGRAM {
    const char *szPath;
    const char *szName;
};

inline constexpr PROGRAM PROGRAMS[] = {
    {"/sbin/mdadm", "mdadm"},       {"/sbin/sfdisk", "sfdisk"},     {"/sbin/pvs", "pvs"},
    {"/sbin/lvremove", "lvremove"}, {"/sbin/vgremove", "vgremove"}, {"/sbin/pvremove", "pvremove"},
    {"/bin/umount", "umount"},      {"/bin/nurodd", "nurodd"},
};

// Exit statuses of the program. 0: nothing speaks against the real run.
inline constexpr int STATUS_CLEAN = 0;
inline constexpr int STATUS_NOT_REHEARSED = 2;
inline constexpr int STATUS_WARNED = 3;
