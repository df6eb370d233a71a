// SPDX-License-Identifier: MIT
//
//   mdrequests PROGRAM [ARGUMENT...]
//
// Runs a program as on the appliance, whose md driver has two requests more than the stock one. The
// kernel suspends the program, and whatever it starts, at these two requests and nowhere else.
//
// This process becomes the program, so that the program has the process ID, the signals and the
// exit status of a direct start. A detached server answers the requests until the last of the
// programs has ended.
#include "request_filter.h"
#include "request_server.h"

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

// The same as those of env, nohup and timeout.
constexpr int STATUS_FAILED = 125;
constexpr int STATUS_NOT_EXECUTABLE = 126;
constexpr int STATUS_NOT_FOUND = 127;

int Complain(const char *szWhat, int error)
{
    (void)fprintf(stderr, "mdrequests: %s: %s\n", szWhat, strerror(error));
    return STATUS_FAILED;
}

int ComplainOfKernel()
{
    (void)fputs("mdrequests: this kernel cannot hold a program at a request; "
                "Linux 5.9 and later can, with CONFIG_SECCOMP_FILTER\n",
                stderr);
    return STATUS_FAILED;
}

// --- passing the listener from the program to the server ---------------------------------------

// A descriptor is sent along with a message, which must have at least one byte.
struct LETTER {
    char byte;
    iovec data;
    alignas(cmsghdr) unsigned char control[CMSG_SPACE(sizeof(int))];
    msghdr message;
};

void LetterOpen(LETTER *pLetter)
{
    *pLetter = {};
    pLetter->data = {.iov_base = &pLetter->byte, .iov_len = 1};
    pLetter->message.msg_iov = &pLetter->data;
    pLetter->message.msg_iovlen = 1;
    pLetter->message.msg_control = pLetter->control;
    pLetter->message.msg_controllen = sizeof(pLetter->control);
}

bool ListenerSend(int fdSocket, int fdListener)
{
    LETTER letter;

    LetterOpen(&letter);
    cmsghdr *const pHeader = CMSG_FIRSTHDR(&letter.message);
    pHeader->cmsg_level = SOL_SOCKET;
    pHeader->cmsg_type = SCM_RIGHTS;
    pHeader->cmsg_len = CMSG_LEN(sizeof(int));
    memcpy(CMSG_DATA(pHeader), &fdListener, sizeof(int));
    return sendmsg(fdSocket, &letter.message, MSG_NOSIGNAL) == 1;
}

// Returns -1 when the other side sent none.
int ListenerReceive(int fdSocket)
{
    LETTER letter;
    int fdListener = -1;

    LetterOpen(&letter);
    if (recvmsg(fdSocket, &letter.message, MSG_CMSG_CLOEXEC) == 1) {
        const cmsghdr *const pHeader = CMSG_FIRSTHDR(&letter.message);
        if (pHeader != nullptr && pHeader->cmsg_type == SCM_RIGHTS) {
            memcpy(&fdListener, CMSG_DATA(pHeader), sizeof(int));
        }
    }
    return fdListener;
}

// --- the server --------------------------------------------------------------------------------

constexpr int FD_SOCKET = STDERR_FILENO + 1;

// Lets go of all that the program uses: a reader of its output must see the end of it, its terminal
// may close, and its working directory may be removed. Only the socket is left open, as FD_SOCKET,
// besides three streams on /dev/null.
bool PlaceLeave(int fdSocket)
{
    // If one of the three streams was closed, the socket may have its number.
    const int fdKept = fcntl(fdSocket, F_DUPFD, FD_SOCKET);
    const int fdNull = open("/dev/null", O_RDWR);
    if (fdKept < 0 || fdNull < 0) {
        return false;
    }
    for (int fd = STDIN_FILENO; fd <= STDERR_FILENO; fd++) {
        if (dup2(fdNull, fd) != fd) {
            return false;
        }
    }
    return dup2(fdKept, FD_SOCKET) >= 0 && syscall(SYS_close_range, FD_SOCKET + 1, ~0U, 0) == 0 &&
           chdir("/") == 0 && setsid() >= 0;
}

// Ends when no process is left that could make a request.
[[noreturn]] void ServerBecome(int fdSocket)
{
    if (!PlaceLeave(fdSocket)) {
        _exit(EXIT_FAILURE);
    }
    const int fdListener = ListenerReceive(FD_SOCKET);
    (void)close(FD_SOCKET);
    pollfd polled = {.fd = fdListener, .events = POLLIN, .revents = 0};
    while (fdListener >= 0 && poll(&polled, 1, -1) > 0 && (polled.revents & POLLIN) != 0) {
        RequestServe(fdListener);
    }
    _exit(EXIT_SUCCESS);
}

// The intermediate child ends at once, so that the program has no child that it does not know of.
// Returns the socket through which the listener is sent, or -1 with errno.
int ServerStart()
{
    int sockets[2];

    if (socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0, sockets) != 0) {
        return -1;
    }
    const pid_t pid = fork();
    if (pid == 0) {
        const pid_t pidServer = fork();
        if (pidServer == 0) {
            (void)close(sockets[0]);
            ServerBecome(sockets[1]);
        }
        _exit(pidServer < 0 ? errno : 0);
    }
    const int error = errno;
    int status = 0;
    (void)close(sockets[1]);
    if (pid > 0 && (waitpid(pid, &status, 0) != pid || status == 0)) {
        return sockets[0];
    }
    (void)close(sockets[0]);
    errno = pid < 0 ? error : WEXITSTATUS(status);
    return -1;
}

// --- the program -------------------------------------------------------------------------------

// Returns 0, or the status to exit with. Under another mdrequests the requests are answered
// already, and the server that was started for this one ends.
int RequestsHandOver()
{
    const int fdSocket = ServerStart();
    if (fdSocket < 0) {
        return Complain("no server", errno);
    }
    const int fdListener = RequestFilterInstall();
    const int error = errno;
    const bool fSent = fdListener >= 0 && ListenerSend(fdSocket, fdListener);
    (void)close(fdSocket);
    (void)close(fdListener);
    if (fSent || (fdListener < 0 && error == EBUSY)) {
        return 0;
    }
    return fdListener < 0 && error == ENOSYS ? ComplainOfKernel() : Complain("no filter", error);
}

int ProgramBecome(char **argv)
{
    (void)execvp(argv[0], argv);
    const int error = errno;
    (void)Complain(argv[0], error);
    return error == ENOENT || error == ENOTDIR ? STATUS_NOT_FOUND : STATUS_NOT_EXECUTABLE;
}

} // namespace

int main(int argc, char **argv)
{
    if (argc < 2 || argv[1][0] == '-') {
        (void)fputs("usage: mdrequests PROGRAM [ARGUMENT...]\n", stderr);
        return STATUS_FAILED;
    }
    if (!RequestServerFits()) {
        return ComplainOfKernel();
    }
    const int status = RequestsHandOver();
    return status != 0 ? status : ProgramBecome(argv + 1);
}
