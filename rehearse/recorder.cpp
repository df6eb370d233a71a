// SPDX-License-Identifier: MIT
#include "recorder.h"

#include "journal.h"
#include "places.h"
#include "text.h"

#include <algorithm>
#include <csignal>
#include <cstring>
#include <iterator>
#include <string>
#include <sys/auxv.h>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

constexpr int STATUS_NOT_RECORDED = 126;
constexpr int STATUS_NOT_EXECUTABLE = 127;
constexpr int STATUS_BY_SIGNAL = 128;

std::string NameOf(const std::string &szPath)
{
    return szPath.substr(szPath.rfind('/') + 1);
}

bool IsOperand(const std::string &szWord)
{
    return !szWord.empty() && szWord[0] != '-';
}

bool IsNumberOption(const std::string &szWord)
{
    return szWord.size() > 2 && szWord.compare(0, 2, "-N") == 0 &&
           szWord.find_first_not_of("0123456789", 2) == std::string::npos;
}

// mdadm -E DEVICE...
bool IsExamination(const WORDS &argv)
{
    return argv.size() > 2 && argv[1] == "-E" &&
           std::all_of(argv.begin() + 2, argv.end(), IsOperand);
}

// sfdisk -l -uS -N3 DEVICE
bool IsListing(const WORDS &argv)
{
    return argv.size() > 2 && argv[1] == "-l" && IsOperand(argv.back()) &&
           std::all_of(argv.begin() + 2, argv.end() - 1, [](const std::string &szWord) {
               return szWord == "-uS" || IsNumberOption(szWord);
           });
}

// pvs -o FIELDS --noheading --separator :
bool IsVolumeListing(const WORDS &argv)
{
    for (size_t i = 1; i < argv.size(); i++) {
        const bool fValue = argv[i] == "-o" || argv[i] == "--separator";
        if (!fValue && argv[i] != "--noheading") {
            return false;
        }
        i += fValue ? 1 : 0;
        if (i >= argv.size() || (fValue && !IsOperand(argv[i]))) {
            return false;
        }
    }
    return true;
}

struct QUESTION_ROW {
    const char *szName;
    bool (*pIs)(const WORDS &argv);
};

constexpr QUESTION_ROW QUESTIONS[] = {
    {"mdadm", IsExamination},
    {"sfdisk", IsListing},
    {"pvs", IsVolumeListing},
};

bool IsProgram(const std::string &szName)
{
    return std::any_of(std::begin(PROGRAMS), std::end(PROGRAMS),
                       [&](const PROGRAM &program) { return szName == program.szName; });
}

JOURNAL_HEAD HeadOf(JOURNAL_KIND kind, int status)
{
    return {.kind = kind, .pid = getpid(), .parent = getppid(), .status = status};
}

[[noreturn]] void RealBecome(const std::string &szPath, char **argv)
{
    (void)execv(szPath.c_str(), argv);
    (void)ComplainErrno("cannot run %s", szPath.c_str());
    _exit(STATUS_NOT_EXECUTABLE);
}

// The real program runs as a child, so that its status is known.
int QuestionPass(const WORDS &words, char **argv)
{
    if (!JournalSend(HeadOf(JOURNAL_QUESTION, 0), words)) {
        return STATUS_NOT_RECORDED;
    }
    const pid_t pid = fork();
    if (pid == 0) {
        RealBecome(std::string(REAL_FOLDER) + "/" + NameOf(words[0]), argv);
    }
    int status = 0;
    if (pid < 0 || waitpid(pid, &status, 0) != pid) {
        return STATUS_NOT_RECORDED;
    }
    (void)JournalSend(HeadOf(JOURNAL_ANSWERED, status), words);
    if (WIFSIGNALED(status)) {
        (void)raise(WTERMSIG(status));
        return STATUS_BY_SIGNAL + WTERMSIG(status);
    }
    return WEXITSTATUS(status);
}

} // namespace

bool RecorderIsWanted()
{
    const auto szExecuted = reinterpret_cast<const char *>(getauxval(AT_EXECFN));
    return szExecuted != nullptr && NameOf(szExecuted) != PROGRAM_NAME;
}

bool RecorderIsQuestion(const WORDS &argv)
{
    return !argv.empty() &&
           std::any_of(std::begin(QUESTIONS), std::end(QUESTIONS), [&](const QUESTION_ROW &row) {
               return NameOf(argv[0]) == row.szName && row.pIs(argv);
           });
}

int RecorderRun(int argc, char **argv)
{
    const WORDS words(argv, argv + argc);
    if (RecorderIsQuestion(words)) {
        return QuestionPass(words, argv);
    }
    // Where one program is the shell and umount at once, the shell still has to run.
    if (!words.empty() && !IsProgram(NameOf(words[0])) && access(REAL_SHELL_PATH, X_OK) == 0) {
        RealBecome(REAL_SHELL_PATH, argv);
    }
    if (!JournalSend(HeadOf(JOURNAL_RECORDED, 0), words)) {
        (void)Complain("this is no rehearsal; the program's name has to be %s", PROGRAM_NAME);
        return STATUS_NOT_RECORDED;
    }
    return 0;
}
