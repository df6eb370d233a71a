// SPDX-License-Identifier: MIT
#pragma once

// The kernel's part: it holds a program at exactly the two requests, and tells who has the
// listener.

// Filters the calling process and everything that it will start. Returns the listener, a descriptor
// that is closed on exec, or -1 with errno, and then the process must not go on to start anything:
//   EBUSY   a listener is there already, as under another mdrequests: this one may go on
//   ENOSYS  the kernel has no such notification, or one too old to tell when all programs are gone
int RequestFilterInstall();
