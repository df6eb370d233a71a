// SPDX-License-Identifier: MIT
#pragma once

// From now on, requests to devices and calls that shall fail are answered in this process as the
// machine describes them. In a process that is not part of a machine all calls pass through.
void InterposeActivate();

void InterposeDeactivate();
