// SPDX-License-Identifier: MIT
#include "request_server.h"

#include "md_answer.h"

#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <fcntl.h>
#include <linux/seccomp.h>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace
{

// The kernel writes its own version of the message, which may be longer in a newer kernel.
constexpr std::size_t MESSAGE_SIZE = 1024;

union MESSAGE {
    seccomp_notif notification;
    seccomp_notif_resp response;
    unsigned char space[MESSAGE_SIZE];
};

// An open directory of /proc stays bound to its process. Once the request is known to be waiting
// still, nothing reached through the directory can belong to another process, even if the process
// ID is used again.
int TaskOpen(int fdListener, const seccomp_notif *pRequest)
{
    char szTask[32];

    (void)snprintf(szTask, sizeof(szTask), "/proc/%u", pRequest->pid);
    const int fdTask = open(szTask, O_PATH | O_DIRECTORY | O_CLOEXEC);
    if (fdTask >= 0 && ioctl(fdListener, SECCOMP_IOCTL_NOTIF_ID_VALID, &pRequest->id) != 0) {
        (void)close(fdTask);
        return -1;
    }
    return fdTask;
}

// Looks at the descriptor's file without holding it open: a copy would keep the array busy for a
// moment after the program has closed it.
bool DeviceGet(int fdTask, int fdAsked, dev_t *pDevice)
{
    struct stat info;
    char szName[32];

    (void)snprintf(szName, sizeof(szName), "fd/%d", fdAsked);
    if (fstatat(fdTask, szName, &info, 0) != 0 || !S_ISBLK(info.st_mode)) {
        return false;
    }
    *pDevice = info.st_rdev;
    return true;
}

// 0, or the errno that the program gets.
int AnswerWrite(int fdTask, std::uint64_t address, const MD_ANSWER *pAnswer)
{
    const int fdMemory = openat(fdTask, "mem", O_WRONLY | O_CLOEXEC);
    if (fdMemory < 0) {
        return errno;
    }
    const ssize_t cb = pwrite(fdMemory, pAnswer->data, pAnswer->cb, static_cast<off_t>(address));
    (void)close(fdMemory);
    return cb == static_cast<ssize_t>(pAnswer->cb) ? 0 : EFAULT;
}

// What only the kernel can answer (no descriptor, no array) is passed on to it, as if there were no
// listener.
void ResponseMake(int fdTask, const seccomp_notif *pRequest, seccomp_notif_resp *pResponse)
{
    dev_t device;
    MD_ANSWER answer;
    const auto request = static_cast<std::uint32_t>(pRequest->data.args[1]);

    pResponse->flags = SECCOMP_USER_NOTIF_FLAG_CONTINUE;
    if (!DeviceGet(fdTask, static_cast<int>(pRequest->data.args[0]), &device)) {
        return;
    }
    const int result = MdAnswerGet(device, request, &answer);
    if (result == 0) {
        return;
    }
    pResponse->flags = 0;
    pResponse->error = result < 0 ? -ENODEV : -AnswerWrite(fdTask, pRequest->data.args[2], &answer);
}

} // namespace

bool RequestServerFits()
{
    seccomp_notif_sizes sizes = {};

    return syscall(SYS_seccomp, SECCOMP_GET_NOTIF_SIZES, 0, &sizes) == 0 &&
           sizes.seccomp_notif <= MESSAGE_SIZE && sizes.seccomp_notif_resp <= MESSAGE_SIZE;
}

void RequestServe(int fdListener)
{
    MESSAGE request = {};
    MESSAGE reply = {};

    // The kernel requires a zeroed message. The call fails when the program has already ended.
    if (ioctl(fdListener, SECCOMP_IOCTL_NOTIF_RECV, &request) != 0) {
        return;
    }
    reply.response.id = request.notification.id;
    reply.response.flags = SECCOMP_USER_NOTIF_FLAG_CONTINUE;
    const int fdTask = TaskOpen(fdListener, &request.notification);
    if (fdTask >= 0) {
        ResponseMake(fdTask, &request.notification, &reply.response);
        (void)close(fdTask);
    }
    (void)ioctl(fdListener, SECCOMP_IOCTL_NOTIF_SEND, &reply);
}
