// SPDX-License-Identifier: MIT
#include "request_filter.h"

#include "md_answer.h"

#include <cerrno>
#include <cstddef>
#include <cstdint>
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

// ioctl in each system call interface, since a kernel may run programs of more than one.
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
// The last six: allow; load the request and compare it with the two; allow; notify.
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

// Looks at nothing but the architecture and the call's number until it knows that the call is an
// ioctl: so the kernel can remember that every other call is allowed and run no filter for it.
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

// Linux 5.9 brought two things: adding descriptors to other programs, and reporting to a listener
// that no program is left. The first can be tried without harm, as no notification has the ID 0.
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

    // Without root, only programs that cannot gain privileges may be filtered.
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
