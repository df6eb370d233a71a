// SPDX-License-Identifier: MIT
#include "nurostoragecore/space.h"

#include "nurocore/error.h"
#include "nurocore/handle.h"
#include "nurocore/log.h"
#include "nurocore/pipe.h"
#include "nurocore/process.h"
#include "space/command_text.h"

#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <ctime>

namespace
{

constexpr char ERROR_LOG_PATH[] = "/var/log/space_operation_error.log";
constexpr size_t COMMAND_TEXT_SIZE = 1024;
constexpr size_t ERROR_TEXT_SIZE = 2048;
constexpr size_t LOG_LINE_SIZE = 2048;
constexpr size_t TIME_STAMP_SIZE = 32;

// Only the text is truncated if it does not fit, not the command that is run.
void CommandLogText(const char *const argv[], char *szText)
{
    CommandTextBuild(argv, COMMAND_TEXT_SIZE, szText, COMMAND_TEXT_SIZE);
    // Kept: when the text is cut right after a blank, that blank is dropped as well.
    if (strlen(szText) == COMMAND_TEXT_SIZE - 1 && szText[COMMAND_TEXT_SIZE - 2] == ' ') {
        szText[COMMAND_TEXT_SIZE - 2] = '\0';
    }
}

// The first ERROR_TEXT_SIZE - 1 bytes as one line. The rest is read too, so that the tool never
// blocks on a full pipe. Returns false when there was nothing.
bool ErrorTextRead(FILE *pStream, char *szText)
{
    size_t cchText = 0;
    bool fAny = false;
    for (int ch = fgetc(pStream); ch != EOF; ch = fgetc(pStream)) {
        fAny = true;
        if (cchText < ERROR_TEXT_SIZE - 1) {
            szText[cchText++] = static_cast<char>(ch == '\n' ? ' ' : ch);
        }
    }
    szText[cchText] = '\0';
    return fAny;
}

void TimeStampBuild(char *szStamp)
{
    const time_t now = time(nullptr);
    struct tm local = {};
    if (localtime_r(&now, &local) == nullptr ||
        strftime(szStamp, TIME_STAMP_SIZE, "%b %d %H:%M:%S", &local) == 0) {
        szStamp[0] = '\0';
    }
}

} // namespace

int SpaceErrorLog(FILE *pStream, const char *szCommand)
{
    if (pStream == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    char szError[ERROR_TEXT_SIZE];
    if (!ErrorTextRead(pStream, szError)) {
        return 0;
    }
    char szStamp[TIME_STAMP_SIZE];
    TimeStampBuild(szStamp);
    char szLine[LOG_LINE_SIZE];
    const int cchLine = snprintf(szLine, sizeof(szLine), "%s command=\"%s\" Error=\"%s\"", szStamp,
                                 szCommand == nullptr ? "" : szCommand, szError);
    if (cchLine < 0) {
        return -1;
    }
    const STREAM_OWNER pLog(fopen(ERROR_LOG_PATH, "a+"));
    if (pLog == nullptr) {
        NLIBCLog(LOG_ERR, "Fail to open %s", ERROR_LOG_PATH);
        return -1;
    }
    (void)fprintf(pLog.get(), "%s\n", szLine);
    return 0;
}

int SpaceExecv(const char *const argv[])
{
    if (argv == nullptr || argv[0] == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    char szCommand[COMMAND_TEXT_SIZE];
    CommandLogText(argv, szCommand);
    // execv takes the vector without const, but does not write to it.
    FILE *const pStream = NLIBCPopenV(argv[0], "rE", const_cast<char *const *>(argv));
    // A failure to log is not a failure of the command: the tool's own status decides.
    (void)SpaceErrorLog(pStream, szCommand);
    return NLIBCPclose(pStream);
}

int SpaceExecl(const char *szPath, ...)
{
    if (szPath == nullptr) {
        NLIBCErrSetHere(ERR_BAD_PARAMETER);
        return -1;
    }
    va_list arguments;
    va_start(arguments, szPath);
    const HEAP_OWNER<char *> argv(NLIBCArgvAlloc(szPath, arguments));
    va_end(arguments);
    return argv == nullptr ? -1 : SpaceExecv(argv.get());
}
