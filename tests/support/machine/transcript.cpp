// SPDX-License-Identifier: MIT
#include "transcript.h"

#include "wire.h"
#include "words.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cctype>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace
{

constexpr size_t TIME_STAMP_SIZE = sizeof("Jan  1 00:00:00 ") - 1;

// "file.cpp:123 text" becomes "file.cpp:# text".
std::string LineMasked(std::string_view szText)
{
    const size_t iColon = szText.find(':');
    size_t iEnd = iColon == std::string_view::npos ? iColon : iColon + 1;
    while (iEnd < szText.size() && isdigit(static_cast<unsigned char>(szText[iEnd])) != 0) {
        iEnd++;
    }
    if (iColon == std::string_view::npos || iEnd == iColon + 1 || iEnd >= szText.size() ||
        szText[iEnd] != ' ') {
        return std::string(szText);
    }
    return std::string(szText.substr(0, iColon)) + ":#" + std::string(szText.substr(iEnd));
}

LOG_LINE LogLineParse(std::string_view szDatagram)
{
    LOG_LINE line;
    const size_t iEnd = szDatagram.find('>');
    if (iEnd == std::string_view::npos) {
        line.szText = szDatagram;
        return line;
    }
    line.priority = atoi(std::string(szDatagram.substr(1, iEnd - 1)).c_str());
    szDatagram.remove_prefix(std::min(iEnd + 1 + TIME_STAMP_SIZE, szDatagram.size()));
    const size_t iTagEnd = szDatagram.find(": ");
    if (iTagEnd != std::string_view::npos) {
        line.szTag = szDatagram.substr(0, iTagEnd);
        szDatagram.remove_prefix(iTagEnd + 2);
    }
    line.szText = LineMasked(szDatagram);
    return line;
}

std::string LogLineText(const LOG_LINE &line)
{
    return "<" + std::to_string(line.priority) + ">" + line.szText + "\n";
}

void CommandParse(std::string_view &szRecord, RUN_EVENT &event)
{
    event.szExecuted = WireField(szRecord);
    event.fNullInput = WireNumber(szRecord) == 1;
    event.fNullOutput = WireNumber(szRecord) == 1;
    event.fNullError = WireNumber(szRecord) == 1;
    event.nDescriptors = static_cast<int>(WireNumber(szRecord));
    std::string_view szField;
    for (long n = WireNumber(szRecord); n > 0 && WireTake(szRecord, szField); n--) {
        event.argv.emplace_back(szField);
    }
    while (WireTake(szRecord, szField)) {
        event.environment.emplace_back(szField);
    }
}

void EventParse(std::string_view &szRecord, RUN_EVENT &event)
{
    const std::string_view szKind = WireField(szRecord);
    if (szKind == WIRE_COMMAND || szKind == WIRE_UNEXPECTED) {
        event.fExpected = szKind == WIRE_COMMAND;
        CommandParse(szRecord, event);
        return;
    }
    event.kind = szKind == WIRE_SLEEP ? EVENT_KIND::SLEEP : EVENT_KIND::FAULT;
    event.argv.emplace_back(szKind);
    for (std::string_view szField; WireTake(szRecord, szField);) {
        if (!szField.empty()) {
            event.argv.emplace_back(szField);
        }
    }
}

void EventProblemsAdd(const RUN_EVENT &event, RUN_RESULT &result)
{
    if (event.kind != EVENT_KIND::COMMAND) {
        return;
    }
    if (!event.fExpected) {
        result.problems.push_back("a command that no row expects: " + WordsText(event.argv));
    }
    if (event.argv.empty() || event.argv[0] != event.szExecuted) {
        result.problems.push_back("not called by its own path: " + WordsText(event.argv) + " is " +
                                  event.szExecuted);
    }
}

std::vector<std::string> Sorted(std::vector<std::string> words)
{
    std::sort(words.begin(), words.end());
    return words;
}

// True for a command that may be run or not: which of the two it is, is chance.
bool IsOptional(const MACHINE &machine, const RUN_EVENT &event)
{
    return std::any_of(machine.rows.begin(), machine.rows.end(), [&](const TOOL_ROW &row) {
        return row.answer.nTimes == ANY_TIMES && !event.argv.empty() &&
               event.argv[0] == row.argv[0];
    });
}

// Each kind of thing under a heading of its own; every command with all that is known of it. Last
// words before a signal are the C library's, and the emulator's.
std::string KeptText(const MACHINE &machine, const RUN_RESULT &result)
{
    std::string szText = "status " + std::to_string(result.status) + " signal " +
                         std::to_string(result.signal) + "\n== output\n" + result.szOut +
                         "\n== errors\n" + (result.signal == 0 ? result.szErr : "") + "\n== log\n";
    for (const LOG_LINE &line : result.log) {
        szText +=
            "<" + std::to_string(line.priority) + ">" + line.szTag + ": " + line.szText + "\n";
    }
    szText += "== events\n";
    for (const RUN_EVENT &event : result.events) {
        if (event.kind == EVENT_KIND::SLEEP) {
            szText += WordsText(event.argv) + "\n";
        } else if (event.kind == EVENT_KIND::COMMAND && !IsOptional(machine, event)) {
            szText += WordsText(event.argv) + "\n";
            szText += "    " + event.szExecuted + " null " + std::to_string(event.fNullInput) +
                      std::to_string(event.fNullOutput) + std::to_string(event.fNullError) +
                      " open " + std::to_string(event.nDescriptors) + " environment " +
                      WordsText(Sorted(event.environment)) + "\n";
        }
    }
    return szText;
}

} // namespace

std::string TestName()
{
    const testing::TestInfo *const pTest = testing::UnitTest::GetInstance()->current_test_info();
    return pTest == nullptr ? "" : std::string(pTest->test_suite_name()) + "." + pTest->name();
}

void TranscriptKeep(const MACHINE &machine, const RUN_RESULT &result)
{
    static std::string szTest;
    static int nRun = 0;
    const char *const szFolder = getenv("ARRAYCTL_TRANSCRIPTS");
    if (szFolder == nullptr) {
        return;
    }
    nRun = szTest == TestName() ? nRun + 1 : 1;
    szTest = TestName();
    std::string szPath = szTest + "." + std::to_string(nRun);
    std::replace(szPath.begin(), szPath.end(), '/', '_');
    szPath = std::string(szFolder) + "/" + szPath;
    FILE *const pFile = fopen(szPath.c_str(), "we");
    const std::string szText = KeptText(machine, result);
    if (pFile == nullptr || fwrite(szText.data(), 1, szText.size(), pFile) != szText.size() ||
        fclose(pFile) != 0) {
        perror(szPath.c_str());
        abort();
    }
}

void DatagramTake(std::string_view szDatagram, RUN_RESULT &result)
{
    if (szDatagram.starts_with('<')) {
        result.log.push_back(LogLineParse(szDatagram));
        return;
    }
    RUN_EVENT event;
    event.nLogBefore = result.log.size();
    EventParse(szDatagram, event);
    if (!szDatagram.empty()) {
        result.problems.emplace_back("what happened cannot be read");
    }
    EventProblemsAdd(event, result);
    result.events.push_back(std::move(event));
}

void RowsCompare(const MACHINE &machine, RUN_RESULT &result)
{
    const std::string szUsed = MachineFileRead(WIRE_USED).value_or("");
    for (size_t i = 0; i < machine.rows.size(); i++) {
        std::uint32_t nUsed = 0;
        if (szUsed.size() >= (i + 1) * sizeof(nUsed)) {
            memcpy(&nUsed, szUsed.data() + i * sizeof(nUsed), sizeof(nUsed));
        }
        const TOOL_ROW &row = machine.rows[i];
        if (row.answer.nTimes >= 0 && nUsed != static_cast<std::uint32_t>(row.answer.nTimes)) {
            result.problems.push_back("expected " + std::to_string(row.answer.nTimes) +
                                      " times, run " + std::to_string(nUsed) +
                                      " times: " + WordsText(row.argv));
        }
    }
}

std::string Lines(const std::vector<std::string> &lines)
{
    std::string szText;
    for (const std::string &szLine : lines) {
        szText += szLine + "\n";
    }
    return szText;
}

std::string LogText(const RUN_RESULT &result)
{
    std::string szText;
    for (const LOG_LINE &line : result.log) {
        szText += LogLineText(line);
    }
    return szText;
}

std::string TranscriptText(const RUN_RESULT &result)
{
    std::string szText;
    for (const RUN_EVENT &event : result.events) {
        szText += WordsText(event.argv) + "\n";
    }
    return szText;
}

std::string OrderText(const RUN_RESULT &result)
{
    std::string szText;
    size_t iLine = 0;
    for (const RUN_EVENT &event : result.events) {
        for (; iLine < event.nLogBefore; iLine++) {
            szText += LogLineText(result.log[iLine]);
        }
        szText += WordsText(event.argv) + "\n";
    }
    for (; iLine < result.log.size(); iLine++) {
        szText += LogLineText(result.log[iLine]);
    }
    return szText;
}
