// SPDX-License-Identifier: MIT
#pragma once

// Takes up what the machine says of devices and failing calls, in this process from now on. A
// process that is no machine's has nothing to take up, and all calls pass through.
void InterposeActivate();

void InterposeDeactivate();
