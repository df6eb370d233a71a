// SPDX-License-Identifier: MIT
#pragma once

// The kernel's part: a system call filter that suspends a program at exactly the two requests and
// notifies the holder of the listener.

// Filters the calling process and everything that it will start. Returns the listener, a descriptor
// that is closed on exec, or -1 with errno. After a failure other than EBUSY the process must not
// start anything:
//   EBUSY   there is a listener already, as under another mdrequests
//   ENOSYS  the kernel has no such notification, or cannot report that all programs have ended
int RequestFilterInstall();
