// SPDX-License-Identifier: MIT
#pragma once

// The place in which the tool is rehearsed: this process's mount namespace, changed so that nothing
// that runs in it can leave anything behind.

// Makes the mount namespace of this process the stage: every file system read-only, /tmp, /var/log
// and the folders of locks private, the recorder over the tool's programs, the tool itself at
// TOOL_PATH. The sockets are bound to where the recorder and syslog look for them; fdSyslog stays
// unbound where the machine has no /dev/log. False, with a sentence, when a part of it cannot be
// had.
bool StageSetUp(const char *szTool, int fdJournal, int fdSyslog);

// From here on this process and its children cannot open a block device for writing, or mount
// anything, where the kernel can promise that; and some rights go with the next program that they
// become. Returns 1 when the kernel promised, 0 when it cannot, -1 with a sentence on failure.
int StageClose();
