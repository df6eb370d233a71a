// SPDX-License-Identifier: MIT
#pragma once

// A test as one list of steps: what happens on the machine, in order, and what the tools answer.
//
//     ExpectCalls({
//         {.szName = "a stop that fails once",
//          .machine = MachineWithMirror(),
//          .call = [] { return RAIDStop("/dev/md2"); },
//          .result = -1,
//          .steps = {{"/sbin/mdadm -S /dev/md2", {.status = 1}},
//                    {"<11>raid_remove.cpp:# Failed to mdadm stop '/dev/md2'"}}},
//     });
//
// A step is a line of OrderText. One that begins with a slash is a command: the machine gets a row
// for it, with the answer given beside it. Exactly these steps must happen.

#include "last_error.h"
#include "sandbox.h"

#include <functional>
#include <gtest/gtest.h>
#include <ostream>
#include <string>
#include <vector>

struct STEP {
    std::string szText;
    TOOL_ANSWER answer = {};
};

using STEPS = std::vector<STEP>;

inline STEPS operator+(STEPS steps, const STEPS &more)
{
    steps.insert(steps.end(), more.begin(), more.end());
    return steps;
}

// The same steps nTimes times.
inline STEPS operator*(int nTimes, const STEPS &steps)
{
    STEPS all;
    for (int i = 0; i < nTimes; i++) {
        all = all + steps;
    }
    return all;
}

// Adds the rows of the commands. An empty argument is written as two double quotes.
inline void StepsExpect(MACHINE &machine, const STEPS &steps)
{
    for (const STEP &step : steps) {
        if (!step.szText.starts_with('/')) {
            continue;
        }
        std::vector<std::string> argv(1);
        for (const char ch : step.szText) {
            if (ch == ' ') {
                argv.emplace_back();
            } else if (ch != '"') {
                argv.back() += ch;
            }
        }
        MachineTool(machine, argv, step.answer);
    }
}

inline std::string StepsText(const STEPS &steps)
{
    std::string szText;
    for (const STEP &step : steps) {
        szText += step.szText + "\n";
    }
    return szText;
}

inline void ExpectSteps(const RUN_RESULT &result, const STEPS &steps)
{
    EXPECT_EQ(OrderText(result), StepsText(steps));
}

// Names the tests of a table after its rows: the last argument of INSTANTIATE_TEST_SUITE_P.
struct ROW_NAME {
    template <typename ROW>
    std::string operator()(const testing::TestParamInfo<ROW> &row) const
    {
        return row.param.szName;
    }
};

// One call of a library on a machine of its own: what it returns, the code that it leaves in the
// last-error record (OLD_CODE: it does not change the record), what it does.
struct CALL_CASE {
    const char *szName;
    MACHINE machine = MachineMake();
    std::function<long long()> call = {};
    long long result = 0;
    u32 code = OLD_CODE;
    STEPS steps = {};
};

inline void PrintTo(const CALL_CASE &row, std::ostream *pStream)
{
    *pStream << row.szName;
}

inline RUN_RESULT ExpectCall(const CALL_CASE &row)
{
    SCOPED_TRACE(row.szName);
    MACHINE machine = row.machine;
    StepsExpect(machine, row.steps);
    const RUN_RESULT result = MachineCall(machine, [&row] {
        RecordReset();
        EXPECT_EQ(row.call(), row.result);
        EXPECT_EQ(NLIBCErrGet(), row.code);
    });
    ExpectSteps(result, row.steps);
    return result;
}

inline void ExpectCalls(const std::vector<CALL_CASE> &rows)
{
    for (const CALL_CASE &row : rows) {
        (void)ExpectCall(row);
    }
}

// The program with these arguments: what it prints, how it ends, what it does.
struct RUN_CASE {
    const char *szName;
    MACHINE machine = MachineMake();
    std::vector<std::string> arguments = {};
    std::string szOut = {};
    int status = 0;
    STEPS steps = {};
};

inline void PrintTo(const RUN_CASE &row, std::ostream *pStream)
{
    *pStream << row.szName;
}

inline RUN_RESULT ExpectRun(const RUN_CASE &row)
{
    SCOPED_TRACE(row.szName);
    MACHINE machine = row.machine;
    StepsExpect(machine, row.steps);
    RUN_RESULT result = MachineRun(machine, row.arguments);
    EXPECT_EQ(result.szOut, row.szOut);
    EXPECT_EQ(result.szErr, "");
    EXPECT_EQ(result.status, row.status);
    ExpectSteps(result, row.steps);
    return result;
}

inline void ExpectRuns(const std::vector<RUN_CASE> &rows)
{
    for (const RUN_CASE &row : rows) {
        (void)ExpectRun(row);
    }
}

// ---- machines in one expression ----------------------------------------------------------------

inline MACHINE With(MACHINE machine, const std::function<void(MACHINE &)> &change)
{
    change(machine);
    return machine;
}

inline MACHINE WithFault(MACHINE machine, const MACHINE_FAULT &fault)
{
    machine.faults.push_back(fault);
    return machine;
}

inline MACHINE WithFile(MACHINE machine, const std::string &szPath, const std::string &szText)
{
    MachineFile(machine, szPath, szText);
    return machine;
}

inline MACHINE Without(MACHINE machine, const std::string &szPath)
{
    MachineRemove(machine, szPath);
    return machine;
}

inline MACHINE WithTool(MACHINE machine, const std::string &szTool, TOOL_KIND kind)
{
    machine.tools[szTool] = kind;
    return machine;
}
