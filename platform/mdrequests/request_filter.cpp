// SPDX-License-Identifier: MIT
#include "request_filter.h"

#include "md_answer.h"

#include <cerrno>
#include <cstddef>
#include <linux/audit.h>
#include <linux/filter.h>
#include <linux/seccomp.h>
#include <sys/ioctl.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace
{

struct IOCTL_CALL {
    std::uint32_t arch;
    std::uint32_t number;
};

// The call by each of its names: a kernel may run programs of more than one kind.
#if defined(__x86_64__)
constexpr IOCTL_CALL IOCTL_CALLS[] = {
    {AUDIT_ARCH_X86_64, 16},
    {AUDIT_ARCH_X86_64, 0x40000000 | 514}, // 32-bit pointers, 64-bit registers
    {AUDIT_ARCH_I386, 54},
};
#elif defined(__i386__)
constexpr IOCTL_CALL IOCTL_CALLS[] = {{AUDIT_ARCH_I386, 54}};
#elif defined(__powerpc__) && !defined(__powerpc64__)
constexpr IOCTL_CALL IOCTL_CALLS[] = {{AUDIT_ARCH_PPC, 54}};
#else
#error "add this processor's name and number of ioctl, or build with -DARRAYCTL_BUILD_PLATFORM=OFF"
#endif

// Requests have 32 bits; a register that holds one may be wider.
#if __BYTE_ORDER__ == __ORDER_LITTLE_ENDIAN__
constexpr std::uint32_t LOW_WORD = 0;
#else
constexpr std::uint32_t LOW_WORD = 4;
#endif

constexpr std::uint32_t ARCH = offsetof(seccomp_data, arch);
constexpr std::uint32_t NUMBER = offsetof(seccomp_data, nr);
constexpr std::uint32_t REQUEST = offsetof(seccomp_data, args[1]) + LOW_WORD;

constexpr std::size_t STEPS_A_CALL = 4;
constexpr std::size_t STEPS_OF_CALLS = STEPS_A_CALL * (sizeof(IOCTL_CALLS) / sizeof(*IOCTL_CALLS));
// The end: let it pass; is it one of the two; let it pass; notify.
constexpr std::size_t STEPS = STEPS_OF_CALLS + 6;

struct FILTER {
    sock_filter steps[STEPS];
};

constexpr sock_filter Step(std::uint16_t code, std::uint32_t value, std::size_t ifTrue = 0,
                           std::size_t ifFalse = 0)
{
    return {code, static_cast<std::uint8_t>(ifTrue), static_cast<std::uint8_t>(ifFalse), value};
}

constexpr std::uint16_t LOAD = BPF_LD | BPF_W | BPF_ABS;
constexpr std::uint16_t EQUAL = BPF_JMP | BPF_JEQ | BPF_K;
constexpr std::uint16_t RETURN = BPF_RET | BPF_K;

// Looks at nothing but the kind of program and the call's number before it knows that it is an
// ioctl: so the kernel remembers for every other call that it passes, and runs no filter for it.
constexpr FILTER FilterMake()
{
    FILTER filter = {};
    std::size_t step = 0;

    for (const IOCTL_CALL &call : IOCTL_CALLS) {
        filter.steps[step++] = Step(LOAD, ARCH);
        filter.steps[step++] = Step(EQUAL, call.arch, 0, 2);
        filter.steps[step++] = Step(LOAD, NUMBER);
        filter.steps[step] = Step(EQUAL, call.number, STEPS_OF_CALLS - step, 0);
        step++;
    }
    filter.steps[step++] = Step(RETURN, SECCOMP_RET_ALLOW);
    filter.steps[step++] = Step(LOAD, REQUEST);
    filter.steps[step++] = Step(EQUAL, MD_GET_SYNC_STATUS, 2, 0);
    filter.steps[step++] = Step(EQUAL, MD_GET_ARRAY_STATUS, 1, 0);
    filter.steps[step++] = Step(RETURN, SECCOMP_RET_ALLOW);
    filter.steps[step++] = Step(RETURN, SECCOMP_RET_USER_NOTIF);
    return filter;
}

constexpr FILTER REQUEST_FILTER = FilterMake();

int FilterSet()
{
    FILTER filter = REQUEST_FILTER;
    const sock_fprog program = {.len = STEPS, .filter = filter.steps};

    return static_cast<int>(
        syscall(SYS_seccomp, SECCOMP_SET_MODE_FILTER, SECCOMP_FILTER_FLAG_NEW_LISTENER, &program));
}

// Linux 5.9 has both: it puts descriptors into other programs, and it tells a listener that nobody
// is left. The first can be asked for without harm, as no notification has the number 0 yet.
bool IsNewEnough(int fdListener)
{
    seccomp_notif_addfd addfd = {};

    addfd.srcfd = static_cast<std::uint32_t>(fdListener);
    return ioctl(fdListener, SECCOMP_IOCTL_NOTIF_ADDFD, &addfd) != 0 && errno == ENOENT;
}

} // namespace

int RequestFilterInstall()
{
    int fdListener = FilterSet();

    // Who is not root may filter only programs that cannot become it.
    if (fdListener < 0 && errno == EACCES && prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0) {
        fdListener = FilterSet();
    }
    if (fdListener < 0) {
        errno = errno == EINVAL ? ENOSYS : errno;
        return -1;
    }
    if (!IsNewEnough(fdListener)) {
        (void)close(fdListener);
        errno = ENOSYS;
        return -1;
    }
    return fdListener;
}
