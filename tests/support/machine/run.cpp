// SPDX-License-Identifier: MIT
#include "sandbox.h"

#include "interpose.h"
#include "other_program.h"
#include "private_root.h"
#include "transcript.h"
#include "verdict.h"
#include "wire.h"
#include "words.h"

#include <gtest/gtest-spi.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <poll.h>
#include <sched.h>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

extern char **environ;

// Present in programs that count what runs: a body that ends without it leaves no counts.
extern "C" void __gcov_dump() __attribute__((weak));

namespace
{

constexpr int STATUS_NOT_STARTED = 126;
constexpr size_t LOG_LINE_SIZE = 65536;

// What the supervisor of a run tells at its end.
struct CHILD_REPORT {
    int status; // as wait gives it
    int nUnreaped;
    int nRunning;
};

// The descriptors that a run writes to.
struct RUN_STREAMS {
    int fdIn;
    int fdOut;
    int fdErr;
    int fdFailures; // of the body of MachineCall
};

using BODY = std::function<void(const RUN_STREAMS &)>;

int MemoryFile(const char *szName, std::string_view szText = {})
{
    const int fd = memfd_create(szName, MFD_CLOEXEC);
    if (fd < 0 || write(fd, szText.data(), szText.size()) != static_cast<ssize_t>(szText.size()) ||
        lseek(fd, 0, SEEK_SET) != 0) {
        perror("sandbox: memfd");
        abort();
    }
    return fd;
}

std::string MemoryFileTake(int fd)
{
    struct stat info = {};
    (void)fstat(fd, &info);
    std::string szText(static_cast<size_t>(info.st_size), '\0');
    const ssize_t cb = pread(fd, szText.data(), szText.size(), 0);
    szText.resize(cb < 0 ? 0 : static_cast<size_t>(cb));
    close(fd);
    return szText;
}

// ---- the process that is watched ---------------------------------------------------------------

void PrivateRootGoInside()
{
    if (chroot(PrivateRootFolder().c_str()) != 0 || chdir("/") != 0) {
        perror("sandbox: chroot");
        _exit(STATUS_NOT_STARTED);
    }
}

void StreamsTake(const RUN_STREAMS &streams)
{
    (void)dup2(streams.fdIn, STDIN_FILENO);
    (void)dup2(streams.fdOut, STDOUT_FILENO);
    (void)dup2(streams.fdErr, STDERR_FILENO);
    (void)close_range(STDERR_FILENO + 1, static_cast<unsigned int>(streams.fdFailures) - 1, 0);
    (void)close_range(static_cast<unsigned int>(streams.fdFailures) + 1, ~0U, 0);
}

std::vector<char *> Pointers(std::vector<std::string> &strings)
{
    std::vector<char *> pointers;
    for (std::string &sz : strings) {
        pointers.push_back(sz.data());
    }
    pointers.push_back(nullptr);
    return pointers;
}

std::vector<std::string> EnvironmentOf(const MACHINE &machine)
{
    std::vector<std::string> environment;
    for (const auto &[szName, szValue] : machine.environment) {
        environment.push_back(szName + "=" + szValue);
    }
    environment.push_back("LD_PRELOAD=" WIRE_INTERPOSE);
#ifdef SANDBOX_SANITIZED
    environment.push_back("ASAN_OPTIONS=verify_asan_link_order=0:allocator_may_return_null=1");
    environment.push_back("UBSAN_OPTIONS=print_stacktrace=1");
#endif
    return environment;
}

// ARRAYCTL_RUNNER is a program, with arguments, that runs the tool: an emulator of its processor.
[[noreturn]] void RunnerBecome(const std::string &szProgram, const std::string &szName,
                               const std::vector<std::string> &arguments,
                               std::vector<std::string> environment,
                               const std::function<void()> &prepare = {})
{
    std::vector<std::string> argv = {szName};
    std::string szExecuted = szProgram;
    if (const char *const szRunner = getenv("ARRAYCTL_RUNNER")) {
        argv = Split(szRunner, ' ');
        szExecuted = argv[0];
        argv.insert(argv.end(), {"-0", szName, szProgram});
    }
    argv.insert(argv.end(), arguments.begin(), arguments.end());
    const std::vector<char *> words = Pointers(argv);
    const std::vector<char *> variables = Pointers(environment);
    if (prepare) {
        prepare();
    }
    (void)execve(szExecuted.c_str(), words.data(), variables.data());
    fprintf(stderr, "sandbox: %s: %s\n", szExecuted.c_str(), strerror(errno));
    _exit(STATUS_NOT_STARTED);
}

[[noreturn]] void ProgramBecome(const MACHINE &machine, const std::vector<std::string> &arguments)
{
    RunnerBecome(WIRE_PROGRAM, "arrayctl", arguments, EnvironmentOf(machine), machine.prepare);
}

// Another program of the machine, without the interposing library.
[[noreturn]] void OtherBecome(const MACHINE &machine, const std::vector<std::string> &arguments)
{
    std::vector<std::string> argv = arguments;
    std::vector<std::string> environment;
    for (const auto &[szName, szValue] : machine.environment) {
        environment.push_back(szName + "=" + szValue);
    }
    const std::vector<char *> words = Pointers(argv);
    const std::vector<char *> variables = Pointers(environment);
    if (machine.prepare) {
        machine.prepare();
    }
    (void)execve(words[0], words.data(), variables.data());
    _exit(STATUS_NOT_STARTED);
}

// ---- its supervisor ----------------------------------------------------------------------------

// A sanitizer needs the kernel's /proc of this process namespace.
void ProcMount()
{
#ifdef SANDBOX_SANITIZED
    const std::string szProc = PrivateRootFolder() + WIRE_PROC;
    if (unshare(CLONE_NEWNS) != 0 ||
        mount("proc", szProc.c_str(), "proc", MS_NOSUID | MS_NODEV | MS_NOEXEC, nullptr) != 0) {
        perror("sandbox: proc of the run");
        _exit(STATUS_NOT_STARTED);
    }
#endif
}

// The first process of the run's process namespace: what the program leaves behind becomes its
// child, and is killed when it ends.
[[noreturn]] void Supervise(const RUN_STREAMS &streams, int fdReport, const BODY &body)
{
    (void)prctl(PR_SET_PDEATHSIG, SIGKILL);
    ProcMount();
    CHILD_REPORT report = {};
    const pid_t pid = fork();
    if (pid == 0) {
        StreamsTake(streams);
        PrivateRootGoInside();
        body(streams);
        _exit(0);
    }
    for (pid_t waited = 0; waited != pid;) {
        int status = 0;
        waited = waitpid(-1, &status, 0);
        if (waited == pid) {
            report.status = status;
        } else if (waited > 0) {
            report.nUnreaped++;
        } else if (errno != EINTR) {
            _exit(STATUS_NOT_STARTED);
        }
    }
    while (waitpid(-1, nullptr, WNOHANG) > 0) {
        report.nUnreaped++;
    }
    (void)kill(-1, SIGKILL);
    while (waitpid(-1, nullptr, 0) > 0) {
        report.nRunning++;
    }
    (void)!write(fdReport, &report, sizeof(report));
    _exit(0);
}

// ---- and who watches both ----------------------------------------------------------------------

// Whether there was anything.
bool LogTake(RUN_RESULT &result)
{
    static char ach[LOG_LINE_SIZE];
    bool fAny = false;
    for (ssize_t cb = 0; (cb = recv(PrivateRootLogSocket(), ach, sizeof(ach), MSG_DONTWAIT)) > 0;) {
        DatagramTake({ach, static_cast<size_t>(cb)}, result);
        fAny = true;
    }
    return fAny;
}

bool ReportAwait(int fdReport, int msSilence, RUN_RESULT &result, CHILD_REPORT &report)
{
    using CLOCK = std::chrono::steady_clock;
    const CLOCK::time_point start = CLOCK::now();
    CLOCK::time_point heard = start;
    struct pollfd polled[] = {{fdReport, POLLIN, 0}, {PrivateRootLogSocket(), POLLIN, 0}};
    bool fReported = false;
    while ((polled[0].revents & (POLLIN | POLLHUP)) == 0) {
        const auto silent = CLOCK::now() - heard;
        const auto msSilent = std::chrono::duration_cast<std::chrono::milliseconds>(silent).count();
        if (msSilent >= msSilence) {
            result.fTimedOut = true;
            break;
        }
        (void)poll(polled, std::size(polled), msSilence - static_cast<int>(msSilent));
        heard = LogTake(result) ? CLOCK::now() : heard;
    }
    if (!result.fTimedOut) {
        fReported = read(fdReport, &report, sizeof(report)) == sizeof(report);
    }
    (void)LogTake(result);
    result.seconds = std::chrono::duration<double>(CLOCK::now() - start).count();
    return fReported;
}

void StatusTake(const CHILD_REPORT &report, RUN_RESULT &result)
{
    if (WIFEXITED(report.status)) {
        result.status = WEXITSTATUS(report.status);
    } else {
        result.signal = WTERMSIG(report.status);
    }
    result.nUnreaped = report.nUnreaped;
    result.nRunning = report.nRunning;
}

int SilenceOf(const MACHINE &machine)
{
    return machine.msSilence > 0 ? machine.msSilence : VerdictSilence();
}

void RunProblemsAdd(const MACHINE &machine, bool fReported, RUN_RESULT &result)
{
    if (result.fTimedOut) {
        result.problems.push_back("it hangs: silent for " + std::to_string(SilenceOf(machine)) +
                                  " ms");
    } else if (!fReported) {
        result.problems.emplace_back("the sandbox itself broke down");
    }
    if (!machine.fMayLeaveChildren && result.nUnreaped + result.nRunning > 0) {
        result.problems.push_back("it left " + std::to_string(result.nUnreaped) +
                                  " children unreaped and " + std::to_string(result.nRunning) +
                                  " running");
    }
    for (const char *const szReport : {"Sanitizer", "runtime error: "}) {
        if (result.szErr.find(szReport) != std::string::npos) {
            result.problems.push_back("a sanitizer reports:\n" + result.szErr);
            break;
        }
    }
}

// The supervisor's process number in this namespace; 0 in the supervisor. Not through fork: the
// process namespace has to be new for each run.
pid_t NamespaceFork()
{
    const long pid = syscall(SYS_clone, CLONE_NEWPID | SIGCHLD, 0, 0, 0, 0);
    if (pid < 0) {
        perror("sandbox: clone");
        abort();
    }
    return static_cast<pid_t>(pid);
}

RUN_RESULT Watch(const MACHINE &machine, const BODY &body, std::string &szFailures)
{
    RUN_RESULT leftBehind;
    (void)LogTake(leftBehind);
    RUN_RESULT result;
    RUN_STREAMS streams = {};
    streams.fdIn = MemoryFile("in", machine.szInput);
    streams.fdOut = MemoryFile("out");
    streams.fdErr = MemoryFile("err");
    int fdReport[2] = {-1, -1};
    if (pipe2(fdReport, O_CLOEXEC) != 0) {
        perror("sandbox: pipe2");
        abort();
    }
    streams.fdFailures = MemoryFile("failures");
    (void)fflush(nullptr);

    const pid_t pid = NamespaceFork();
    if (pid == 0) {
        Supervise(streams, fdReport[1], body);
    }
    close(fdReport[1]);
    CHILD_REPORT report = {};
    const bool fReported = ReportAwait(fdReport[0], SilenceOf(machine), result, report);
    (void)kill(pid, SIGKILL);
    (void)waitpid(pid, nullptr, 0);
    close(fdReport[0]);
    close(streams.fdIn);

    result.szOut = MemoryFileTake(streams.fdOut);
    result.szErr = MemoryFileTake(streams.fdErr);
    szFailures = MemoryFileTake(streams.fdFailures);
    if (fReported) {
        StatusTake(report, result);
    }
    RowsCompare(machine, result);
    RunProblemsAdd(machine, fReported, result);
    TranscriptKeep(machine, result);
    return result;
}

// ---- bodies of another processor ---------------------------------------------------------------

// ARRAYCTL_BODIES is this test program, built for the processor of ARRAYCTL_RUNNER. A body then
// runs there: the other program is started inside the machine for the same test, passes by whatever
// the test did before, and ends with the body. BODY_VARIABLE tells it which body that is, and where
// its output and its failures go.
constexpr char BODY_VARIABLE[] = "SANDBOX_BODY";

struct BODY_ORDER {
    int nCall;
    int fdOut;
    int fdFailures;
};

bool BodyOrderGet(BODY_ORDER &order)
{
    const char *const szOrder = getenv(BODY_VARIABLE);
    return szOrder != nullptr &&
           sscanf(szOrder, "%d %d %d", &order.nCall, &order.fdOut, &order.fdFailures) == 3;
}

RUN_RESULT ProgramWatch(const MACHINE &machine, const std::vector<std::string> &arguments,
                        void (*pLayOut)(const MACHINE &))
{
    RUN_RESULT result;
    BODY_ORDER order = {};
    if (BodyOrderGet(order)) {
        return result;
    }
    PrivateRootEnter();
    pLayOut(machine);
    std::string szFailures;
    return Watch(
        machine, [&](const RUN_STREAMS &) { ProgramBecome(machine, arguments); }, szFailures);
}

RUN_RESULT OtherWatch(const MACHINE &machine, const std::vector<std::string> &arguments,
                      void (*pLayOut)(const MACHINE &))
{
    PrivateRootEnter();
    pLayOut(machine);
    std::string szFailures;
    return Watch(
        machine, [&](const RUN_STREAMS &) { OtherBecome(machine, arguments); }, szFailures);
}

RUN_RESULT ProblemsFail(RUN_RESULT result)
{
    for (const std::string &szProblem : result.problems) {
        ADD_FAILURE() << szProblem << "\ntranscript:\n" << TranscriptText(result);
    }
    return result;
}

// ---- failures of a body, handed to the test that called it --------------------------------------

void FailuresSend(int fd, const testing::TestPartResultArray &parts)
{
    std::string szAll;
    for (int i = 0; i < parts.size(); i++) {
        const testing::TestPartResult &part = parts.GetTestPartResult(i);
        if (part.failed()) {
            szAll += std::string(part.file_name() == nullptr ? "" : part.file_name()) + '\n' +
                     std::to_string(part.line_number()) + '\n' + part.message() + '\0';
        }
    }
    (void)!write(fd, szAll.data(), szAll.size());
}

void FailuresReport(const std::string &szFailures)
{
    for (size_t iStart = 0; iStart < szFailures.size();) {
        const size_t iEnd = szFailures.find('\0', iStart);
        const std::string szOne = szFailures.substr(iStart, iEnd - iStart);
        const size_t iLine = szOne.find('\n') + 1;
        const size_t iMessage = szOne.find('\n', iLine) + 1;
        ADD_FAILURE_AT(szOne.substr(0, iLine - 1).c_str(), atoi(szOne.c_str() + iLine))
            << szOne.substr(iMessage);
        iStart = iEnd + 1;
    }
}

[[noreturn]] void BodyRun(const MACHINE &machine, const std::function<void()> &body, int fdFailures)
{
    testing::TestPartResultArray parts;
    const testing::ScopedFakeTestPartResultReporter reporter(
        testing::ScopedFakeTestPartResultReporter::INTERCEPT_ONLY_CURRENT_THREAD, &parts);
    (void)clearenv();
    for (const auto &[szName, szValue] : machine.environment) {
        (void)setenv(szName.c_str(), szValue.c_str(), 1);
    }
    if (machine.prepare) {
        machine.prepare();
    }
    InterposeActivate();
    errno = 0; // that of the test program says nothing about the machine
    body();
    InterposeDeactivate();
    (void)fflush(nullptr);
    FailuresSend(fdFailures, parts);
    if (__gcov_dump != nullptr) {
        __gcov_dump();
    }
    _exit(0);
}

// Bodies of the current test so far, this one included.
int BodyCount()
{
    static std::string szTest;
    static int nCall = 0;
    if (szTest != TestName()) {
        szTest = TestName();
        nCall = 0;
    }
    return ++nCall;
}

// Standard output is put aside until the body begins: the test program has messages of its own.
[[noreturn]] void BodySend(int nCall, int fdFailures)
{
    const int fdOut = dup(STDOUT_FILENO);
    const int fdNull = open("/dev/null", O_WRONLY | O_CLOEXEC);
    (void)dup2(fdNull, STDOUT_FILENO);
    (void)fcntl(fdFailures, F_SETFD, 0);
    char szOrder[64] = "";
    snprintf(szOrder, sizeof(szOrder), "%s=%d %d %d", BODY_VARIABLE, nCall, fdOut, fdFailures);
    RunnerBecome(WIRE_BODIES, program_invocation_short_name, {"--gtest_filter=" + TestName()},
                 {szOrder});
}

// In the other program: passes by every body but the one that is asked for, and ends with that.
void BodyReceive(const BODY_ORDER &order, const MACHINE &machine, const std::function<void()> &body)
{
    if (BodyCount() != order.nCall) {
        return;
    }
    (void)fflush(nullptr);
    (void)dup2(order.fdOut, STDOUT_FILENO);
    close(order.fdOut);
    (void)fcntl(order.fdFailures, F_SETFD, FD_CLOEXEC);
    BodyRun(machine, body, order.fdFailures);
}

} // namespace

RUN_RESULT MachineTry(const MACHINE &machine, const std::vector<std::string> &arguments)
{
    return ProgramWatch(machine, arguments, PrivateRootLayOut);
}

RUN_RESULT MachineTryOther(const MACHINE &machine, const std::vector<std::string> &arguments)
{
    return OtherWatch(machine, arguments, PrivateRootLayOut);
}

RUN_RESULT MachineTryOtherAgain(const MACHINE &machine, const std::vector<std::string> &arguments)
{
    return OtherWatch(machine, arguments, PrivateRootAnswersWrite);
}

RUN_RESULT MachineTryAgain(const MACHINE &machine, const std::vector<std::string> &arguments)
{
    return ProgramWatch(machine, arguments, PrivateRootAnswersWrite);
}

RUN_RESULT MachineRun(const MACHINE &machine, const std::vector<std::string> &arguments)
{
    return ProblemsFail(MachineTry(machine, arguments));
}

RUN_RESULT RunEnds(const MACHINE &machine, const std::vector<std::string> &arguments, int status)
{
    RUN_RESULT result = MachineRun(machine, arguments);
    EXPECT_EQ(result.status, status);
    EXPECT_EQ(result.szErr, "");
    return result;
}

RUN_RESULT RunEnds(const MACHINE &machine, const std::vector<std::string> &arguments, int status,
                   const std::string &szOut)
{
    RUN_RESULT result = RunEnds(machine, arguments, status);
    EXPECT_EQ(result.szOut, szOut);
    return result;
}

RUN_RESULT MachineRunAgain(const MACHINE &machine, const std::vector<std::string> &arguments)
{
    return ProblemsFail(MachineTryAgain(machine, arguments));
}

RUN_RESULT MachineCall(const MACHINE &machine, const std::function<void()> &body)
{
    RUN_RESULT result;
    BODY_ORDER order = {};
    if (BodyOrderGet(order)) {
        BodyReceive(order, machine, body);
        return result;
    }
    PrivateRootEnter();
    PrivateRootLayOut(machine);
    std::string szFailures;
    const int nCall = BodyCount();
    const bool fElsewhere = getenv("ARRAYCTL_BODIES") != nullptr;
    result = Watch(
        machine,
        [&](const RUN_STREAMS &streams) {
            fElsewhere ? BodySend(nCall, streams.fdFailures)
                       : BodyRun(machine, body, streams.fdFailures);
        },
        szFailures);
    FailuresReport(szFailures);
    if (result.status != 0 && !result.fTimedOut) {
        ADD_FAILURE() << "the body ended with status " << result.status << ", signal "
                      << result.signal << "\n"
                      << result.szOut << result.szErr;
    }
    return ProblemsFail(std::move(result));
}

RUN_RESULT QuietCall(const MACHINE &machine, const std::function<void()> &body)
{
    RUN_RESULT result = MachineCall(machine, body);
    EXPECT_EQ(LogText(result), "");
    return result;
}

RUN_RESULT IdleCall(const MACHINE &machine, const std::function<void()> &body)
{
    RUN_RESULT result = MachineCall(machine, body);
    EXPECT_EQ(OrderText(result), "");
    return result;
}

std::vector<std::string> MachineCalls()
{
    return SplitLines(MachineFileRead(WIRE_CALLS).value_or(""));
}

std::optional<std::string> MachineFileRead(const std::string &szPath)
{
    return FileText(PrivateRootFolder() + szPath);
}
