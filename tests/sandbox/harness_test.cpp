// SPDX-License-Identifier: MIT
#include "sandbox.h"

#include <gtest/gtest.h>

TEST(Harness, WhatTheProgramPrintsAndItsStatusComeBack)
{
    const RUN_RESULT result = MachineRun(MachineMake(), {"no-such-word"});
    EXPECT_TRUE(result.szOut.starts_with("command not recognized\nusage:\n"));
    EXPECT_EQ(result.szErr, "");
    EXPECT_EQ(result.status, 1);
    EXPECT_EQ(LogText(result), "");
    EXPECT_EQ(TranscriptText(result), "");
}
