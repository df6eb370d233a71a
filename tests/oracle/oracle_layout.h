// SPDX-License-Identifier: MIT
#pragma once

// The model's machine as a machine of the sandbox.

#include "oracle_machine.h"
#include "sandbox.h"

// Half of the machines have a stand-in for the shell: the exact text that it is given is compared.
// The others have a real shell, so the argument lists that come of the text are.
bool OracleShellIsStandin(const ORACLE_CASE &subject);

// The answers of the model tell a stand-in for the shell what it has to answer.
MACHINE OracleMachineLayOut(const ORACLE_CASE &subject, const std::vector<ORACLE_ANSWER> &answers);
