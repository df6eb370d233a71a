// SPDX-License-Identifier: MIT
#pragma once

// Answers the programs that the kernel has suspended at a request.

// Whether this kernel's messages fit into the server's buffers. If not, it cannot serve a listener.
bool RequestServerFits();

// Takes one request from the listener and answers it, or lets the kernel answer. Call it when the
// listener is readable. It is no failure of the server when the program has ended in the meantime
// or its memory cannot be written.
void RequestServe(int fdListener);
