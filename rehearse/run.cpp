// SPDX-License-Identifier: MIT
#include "run.h"

#include "journal.h"
#include "owner.h"
#include "places.h"
#include "text.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <cstddef>
#include <fcntl.h>
#include <list>
#include <poll.h>
#include <string>
#include <string_view>
#include <sys/signalfd.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <utility>
#include <vector>

namespace
{

constexpr int STATUS_NOT_STARTED = 127;
constexpr size_t OUTPUT_SIZE_MAX = 16777216;
constexpr size_t MESSAGE_SIZE_MAX = 4194304;
constexpr size_t DATAGRAM_SIZE = 65536;

// A recorder that is telling something.
struct TELLER {
    int fd;
    std::string szMessage;
};

struct LISTENER {
    RUN *pRun;
    int fdJournal;
    int fdSyslog;
    int fdOut;
    int fdErr;
    std::list<TELLER> tellers;
};

// Takes what there is. False at its end; errno is 0 when there was something.
bool StreamTake(int fd, std::string *pszText, size_t cbMax)
{
    std::array<char, DATAGRAM_SIZE> buffer = {};
    errno = 0;
    const ssize_t cb = read(fd, buffer.data(), buffer.size());
    if (cb > 0 && pszText->size() < cbMax) {
        pszText->append(buffer.data(), static_cast<size_t>(cb));
    }
    return cb > 0 || (cb < 0 && (errno == EAGAIN || errno == EINTR));
}

void AnswerTake(const JOURNAL_HEAD &head, RUN *pRun)
{
    const auto found =
        std::find_if(pRun->commands.rbegin(), pRun->commands.rend(), [&](const COMMAND &command) {
            return command.fQuestion && command.pid == head.pid;
        });
    if (found != pRun->commands.rend()) {
        found->status = head.status;
    }
}

void MessageTake(const std::string &szMessage, RUN *pRun)
{
    JOURNAL_HEAD head = {};
    COMMAND command = {};
    if (!JournalParse(szMessage, &head, &command.argv)) {
        return;
    }
    if (head.kind == JOURNAL_ANSWERED) {
        AnswerTake(head, pRun);
        return;
    }
    command.pid = head.pid;
    command.parent = head.parent;
    command.fQuestion = head.kind == JOURNAL_QUESTION;
    pRun->commands.push_back(command);
}

// "<11>Nov  5 01:02:03 arrayctl: raid_remove.cpp:10 text": what comes without a number is not the
// system log's.
void DatagramTake(std::string_view datagram, RUN *pRun)
{
    constexpr size_t TIME_SIZE = sizeof("Nov  5 01:02:03 ") - 1;
    const size_t iEnd = datagram.find('>');
    if (datagram.empty() || datagram[0] != '<' || iEnd == std::string_view::npos) {
        return;
    }
    LOG_LINE line = {.priority = static_cast<int>(NumberOf(datagram.substr(1))), .szText = ""};
    datagram.remove_prefix(iEnd + 1);
    datagram.remove_prefix(std::min(TIME_SIZE, datagram.size()));
    line.szText = Trimmed(datagram.substr(0, datagram.find('\0')));
    pRun->log.push_back(line);
}

void SyslogTake(const LISTENER &listener)
{
    std::array<char, DATAGRAM_SIZE> buffer = {};
    ssize_t cb = 0;
    while ((cb = recv(listener.fdSyslog, buffer.data(), buffer.size(), MSG_DONTWAIT)) > 0) {
        DatagramTake({buffer.data(), static_cast<size_t>(cb)}, listener.pRun);
    }
}

void TellersAccept(LISTENER &listener)
{
    const int fd = accept4(listener.fdJournal, nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK);
    if (fd >= 0) {
        listener.tellers.push_back({.fd = fd, .szMessage = ""});
    }
}

// A teller ends its message by closing its side, and waits for a byte that says that it is kept.
void TellersTake(LISTENER &listener)
{
    for (auto teller = listener.tellers.begin(); teller != listener.tellers.end();) {
        if (StreamTake(teller->fd, &teller->szMessage, MESSAGE_SIZE_MAX)) {
            ++teller;
            continue;
        }
        MessageTake(teller->szMessage, listener.pRun);
        (void)send(teller->fd, "k", 1, MSG_NOSIGNAL | MSG_DONTWAIT);
        (void)close(teller->fd);
        teller = listener.tellers.erase(teller);
    }
}

void ListenerPoll(LISTENER &listener, int fdEnded)
{
    std::vector<pollfd> polled;
    for (const int fd :
         {fdEnded, listener.fdJournal, listener.fdSyslog, listener.fdOut, listener.fdErr}) {
        polled.push_back({.fd = fd, .events = POLLIN, .revents = 0});
    }
    for (const TELLER &teller : listener.tellers) {
        polled.push_back({.fd = teller.fd, .events = POLLIN, .revents = 0});
    }
    (void)poll(polled.data(), polled.size(), -1);
}

void ListenerTake(LISTENER &listener)
{
    TellersAccept(listener);
    TellersTake(listener);
    SyslogTake(listener);
    for (const auto &[pfd, pszText] : {std::pair(&listener.fdOut, &listener.pRun->szOut),
                                       std::pair(&listener.fdErr, &listener.pRun->szErr)}) {
        if (*pfd >= 0 && !StreamTake(*pfd, pszText, OUTPUT_SIZE_MAX)) {
            (void)close(*pfd);
            *pfd = -1; // poll leaves it alone
        }
    }
}

std::vector<char *> Pointers(const WORDS &words)
{
    std::vector<char *> pointers;
    for (const std::string &szWord : words) {
        pointers.push_back(const_cast<char *>(szWord.c_str())); // execv does not write to it
    }
    pointers.push_back(nullptr);
    return pointers;
}

// Where the program cannot be started, errno goes to fdFailed unless that is -1.
[[noreturn]] void ProgramBecome(const char *szPath, const WORDS &argv, int fdOut, int fdErr,
                                int fdFailed)
{
    sigset_t none = {};
    const int fdNull = open("/dev/null", O_RDWR | O_CLOEXEC);
    if (fdNull < 0) {
        _exit(STATUS_NOT_STARTED);
    }
    (void)dup2(fdNull, STDIN_FILENO);
    (void)dup2(fdOut, STDOUT_FILENO);
    (void)dup2(fdErr < 0 ? fdNull : fdErr, STDERR_FILENO);
    (void)sigemptyset(&none);
    (void)sigprocmask(SIG_SETMASK, &none, nullptr);
    (void)execv(szPath, Pointers(argv).data());
    (void)!write(fdFailed, &errno, sizeof(errno));
    _exit(STATUS_NOT_STARTED);
}

// This process is the first of its process namespace, so whatever is left behind becomes its child.
// True when the tool itself has ended.
bool ChildrenReap(pid_t pidTool, int *pStatus)
{
    bool fEnded = false;
    int status = 0;
    for (pid_t pid = 0; (pid = waitpid(-1, &status, WNOHANG)) > 0;) {
        if (pid == pidTool) {
            *pStatus = status;
            fEnded = true;
        }
    }
    return fEnded;
}

// What the tool left running ends here; what it said before that is heard.
void LeftoversEnd(LISTENER &listener)
{
    (void)kill(-1, SIGKILL);
    while (waitpid(-1, nullptr, 0) > 0) {
    }
    while (StreamTake(listener.fdOut, &listener.pRun->szOut, OUTPUT_SIZE_MAX) && errno == 0) {
    }
    while (StreamTake(listener.fdErr, &listener.pRun->szErr, OUTPUT_SIZE_MAX) && errno == 0) {
    }
    SyslogTake(listener);
    for (const TELLER &teller : listener.tellers) {
        (void)close(teller.fd);
    }
}

// Reading never waits; what the tool writes to may.
bool PipeMake(int *pfds)
{
    return pipe2(pfds, O_CLOEXEC | O_NONBLOCK) == 0 && fcntl(pfds[1], F_SETFL, 0) == 0;
}

int EndedWatch()
{
    sigset_t ended = {};
    (void)sigemptyset(&ended);
    (void)sigaddset(&ended, SIGCHLD);
    (void)sigprocmask(SIG_BLOCK, &ended, nullptr);
    return signalfd(-1, &ended, SFD_CLOEXEC | SFD_NONBLOCK);
}

} // namespace

bool RunTool(const WORDS &argv, int fdJournal, int fdSyslog, RUN *pRun)
{
    const DESCRIPTOR ended(EndedWatch());
    int out[2] = {-1, -1};
    int err[2] = {-1, -1};
    int failed[2] = {-1, -1};
    const pid_t pid =
        ended.fd >= 0 && PipeMake(out) && PipeMake(err) && PipeMake(failed) ? fork() : -1;
    if (pid < 0) {
        return ComplainErrno("cannot start the tool");
    }
    if (pid == 0) {
        ProgramBecome(TOOL_PATH, argv, out[1], err[1], failed[1]);
    }
    (void)close(out[1]);
    (void)close(err[1]);
    LISTENER listener = {.pRun = pRun,
                         .fdJournal = fdJournal,
                         .fdSyslog = fdSyslog,
                         .fdOut = out[0],
                         .fdErr = err[0],
                         .tellers = {}};
    bool fEnded = false;
    while (!fEnded) {
        struct signalfd_siginfo info = {};
        ListenerPoll(listener, ended.fd);
        fEnded = read(ended.fd, &info, sizeof(info)) > 0 && ChildrenReap(pid, &pRun->status);
        ListenerTake(listener);
    }
    LeftoversEnd(listener);
    const DESCRIPTOR told(failed[0]);
    const DESCRIPTOR telling(failed[1]);
    return read(told.fd, &errno, sizeof(errno)) != sizeof(errno) ||
           ComplainErrno("the tool could not be started");
}

std::string RunQuestion(const WORDS &argv)
{
    const std::string szReal =
        std::string(REAL_FOLDER) + "/" + argv[0].substr(argv[0].rfind('/') + 1);
    int fds[2] = {-1, -1};
    std::string szOut;
    if (access(szReal.c_str(), X_OK) != 0 || pipe2(fds, O_CLOEXEC) != 0) {
        return szOut;
    }
    const pid_t pid = fork();
    if (pid == 0) {
        ProgramBecome(szReal.c_str(), argv, fds[1], -1, -1);
    }
    (void)close(fds[1]);
    while (StreamTake(fds[0], &szOut, OUTPUT_SIZE_MAX)) {
    }
    (void)close(fds[0]);
    (void)waitpid(pid, nullptr, 0);
    return szOut;
}
