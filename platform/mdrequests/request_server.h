// SPDX-License-Identifier: MIT
#pragma once

// Answers the programs that the kernel holds at a request.

// Whether this kernel's messages fit here. False: no listener of it can be served.
bool RequestServerFits();

// Takes one request from the listener and answers it, or lets the kernel answer. Call it when the
// listener is readable. A program that is gone meanwhile, or whose memory cannot be written, is no
// failure of the server.
void RequestServe(int fdListener);
