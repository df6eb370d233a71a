// SPDX-License-Identifier: MIT
//
// Where a rehearsal cannot have what it needs it says so, and changes nothing. Where it can, it
// bears whatever the machine lacks.
#include "other_program.h"
#include "rehearsal.h"

#include <gtest/gtest.h>

#include <array>
#include <cerrno>
#include <cstddef>
#include <fcntl.h>
#include <linux/capability.h>
#include <linux/filter.h>
#include <linux/landlock.h>
#include <linux/seccomp.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

constexpr char PREFIX[] = "arrayctl-rehearse: ";

MACHINE MachineWithOwnTool(const std::string &szScript)
{
    MACHINE machine = MachineMake();
    RehearsalAdd(machine);
    RehearsalToolAdd(machine, szScript);
    return machine;
}

// Rehearses the machine's own tool; before and behind that the machine looks the same.
RUN_RESULT Unchanged(MACHINE machine, const std::string &szForm = "--commands")
{
    const std::function<void()> prepare = std::move(machine.prepare);
    machine.prepare = {};
    (void)MachineTryOther(machine, {"/bin/sh", "-c", ":"});
    const std::vector<std::string> before = RehearsalPicture();
    machine.prepare = prepare;
    RUN_RESULT result = MachineTryOtherAgain(
        machine, RehearsalWords({"--tool", REHEARSAL_OWN_TOOL, szForm, "any"}));
    EXPECT_EQ(RehearsalDifference(before, RehearsalPicture()), "");
    EXPECT_EQ(result.nUnreaped + result.nRunning, 0);
    EXPECT_EQ(LogText(result), "");
    return result;
}

// ---- what the kernel or a container refuses
// ------------------------------------------------------

using FILTER = std::vector<sock_filter>;

// From here on the calls that the filter does not jump over fail in this process and all that it
// becomes. The last of its instructions jumps over one more.
void CallsRefuse(FILTER filter, int error)
{
    filter.push_back(
        BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ERRNO | static_cast<unsigned int>(error)));
    filter.push_back(BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW));
    const sock_fprog program = {.len = static_cast<unsigned short>(filter.size()),
                                .filter = filter.data()};
    if (prctl(PR_SET_SECCOMP, SECCOMP_MODE_FILTER, &program) != 0) {
        _exit(1);
    }
}

void CallRefuse(long number, int error)
{
    CallsRefuse({BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, nr)),
                 BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, static_cast<unsigned int>(number), 0, 1)},
                error);
}

// Only those with these flags; what goes before them is granted.
void MountRefuse(unsigned long flags)
{
    constexpr auto FLAGS = offsetof(seccomp_data, args) + 3 * sizeof(seccomp_data::args[0]);
    CallsRefuse({BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, nr)),
                 BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, SYS_mount, 0, 3),
                 BPF_STMT(BPF_LD | BPF_W | BPF_ABS, FLAGS),
                 BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, static_cast<unsigned int>(flags), 0, 1)},
                EPERM);
}

struct CALL_ROW {
    const char *szName;
    long number;
    int error;
    const char *szError;
};

const CALL_ROW CALL_ROWS[] = {
    {"clone", SYS_clone, EPERM,
     "cannot have mounts and processes of its own here: Operation not permitted\n"},
    {"pipe2", SYS_pipe2, EMFILE, "cannot start: Too many open files\n"},
    {"mount", SYS_mount, EPERM, "cannot keep its mounts to itself: Operation not permitted\n"},
    {"mount_setattr", SYS_mount_setattr, EPERM,
     "cannot make the file systems read-only: Operation not permitted\n"},
    {"a kernel without mount_setattr", SYS_mount_setattr, ENOSYS,
     "this kernel cannot make a whole tree of mounts read-only; Linux 5.12 and later can\n"},
    {"open_tree", SYS_open_tree, EPERM,
     "cannot keep /usr.rehearse/own at hand: Operation not permitted\n"},
    {"chdir", SYS_chdir, EACCES, "cannot leave the working folder: Permission denied\n"},
    {"mkdir", SYS_mkdir, ENOSPC, "cannot make /tmp/.arrayctl-rehearse: No space left on device\n"},
    {"sendfile", SYS_sendfile, ENOSPC, "cannot make the recorder: No space left on device\n"},
    {"move_mount", SYS_move_mount, EPERM,
     "cannot keep the tool at hand: Operation not permitted\n"},
    {"socket", SYS_socket, EPERM, "cannot make a socket: Operation not permitted\n"},
    {"bind", SYS_bind, EPERM,
     "cannot make the socket /tmp/.arrayctl-rehearse/journal: Operation not permitted\n"},
    {"chmod", SYS_chmod, EPERM,
     "cannot make the socket /tmp/.arrayctl-rehearse/journal: Operation not permitted\n"},
    {"listen", SYS_listen, EPERM, "cannot listen to the recorder: Operation not permitted\n"},
    {"prctl", SYS_prctl, EPERM, "cannot end with its watcher: Operation not permitted\n"},
    {"signalfd4", SYS_signalfd4, EMFILE, "cannot start the tool: Too many open files\n"},
};

MACHINE MachineRefusing(const CALL_ROW &row)
{
    MACHINE machine = MachineWithOwnTool("echo ran; /sbin/mdadm -S /dev/md2\n");
    machine.prepare = [row] { CallRefuse(row.number, row.error); };
    return machine;
}

void ExpectRefusal(const RUN_RESULT &result, const char *szError)
{
    EXPECT_EQ(result.status, 2);
    EXPECT_EQ(result.szOut, "");
    EXPECT_EQ(result.szErr, std::string(PREFIX) + szError);
}

TEST(Unchanged, WhenACallIsRefused)
{
    for (const CALL_ROW &row : CALL_ROWS) {
        SCOPED_TRACE(row.szName);
        ExpectRefusal(Unchanged(MachineRefusing(row)), row.szError);
    }
}

struct MOUNT_ROW {
    const char *szName;
    unsigned long flags;
    const char *szError;
};

// In the order in which they are made.
const MOUNT_ROW MOUNT_ROWS[] = {
    {"a private folder", MS_NOSUID | MS_NODEV,
     "cannot lay a private folder over /tmp: Operation not permitted\n"},
    {"a program", MS_BIND, "cannot keep /sbin/mdadm at hand: Operation not permitted\n"},
    {"the seal", MS_REMOUNT | MS_RDONLY | MS_NOSUID | MS_NODEV,
     "cannot make /tmp/.arrayctl-rehearse read-only: Operation not permitted\n"},
};

TEST(Unchanged, WhenALaterMountIsRefused)
{
    for (const MOUNT_ROW &row : MOUNT_ROWS) {
        SCOPED_TRACE(row.szName);
        MACHINE machine = MachineWithOwnTool("echo ran; /sbin/mdadm -S /dev/md2\n");
        machine.prepare = [row] { MountRefuse(row.flags); };
        ExpectRefusal(Unchanged(machine), row.szError);
    }
}

bool KernelHasLandlock()
{
    return syscall(SYS_landlock_create_ruleset, nullptr, 0, LANDLOCK_CREATE_RULESET_VERSION) > 0;
}

// A container that refuses Landlock refuses the rehearsal; a kernel without it does not.
TEST(Unchanged, WhenLandlockIsRefused)
{
    for (const long number :
         {static_cast<long>(SYS_landlock_create_ruleset), static_cast<long>(SYS_landlock_add_rule),
          static_cast<long>(SYS_landlock_restrict_self)}) {
        if (number == SYS_landlock_create_ruleset || KernelHasLandlock()) {
            ExpectRefusal(Unchanged(MachineRefusing({"", number, EPERM, ""})),
                          "cannot forbid writing to block devices: Operation not permitted\n");
        }
    }
    const RUN_RESULT result =
        Unchanged(MachineRefusing({"", SYS_landlock_create_ruleset, ENOSYS, ""}));
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.szOut, "/sbin/mdadm -S /dev/md2\n");
}

// As root is in most containers.
TEST(Unchanged, WithoutTheRightToMount)
{
    MACHINE machine = MachineWithOwnTool("echo ran\n");
    machine.prepare = [] { (void)prctl(PR_CAPBSET_DROP, CAP_SYS_ADMIN, 0, 0, 0); };
    ExpectRefusal(Unchanged(machine),
                  "cannot have mounts and processes of its own here: Operation not permitted\n");
}

// A process of a new user namespace is nobody there until somebody says who it is.
TEST(Unchanged, AsAUserWithoutRights)
{
    std::array<int, 2> fds = {-1, -1};
    ASSERT_EQ(pipe2(fds.data(), O_CLOEXEC), 0);
    const pid_t pid = fork();
    if (pid == 0) {
        (void)dup2(fds[1], STDOUT_FILENO);
        (void)dup2(fds[1], STDERR_FILENO);
        (void)unshare(CLONE_NEWUSER);
        (void)execl(RehearsalProgram(), "arrayctl-rehearse", "--tool", "/bin/true", "any", nullptr);
        _exit(1);
    }
    (void)close(fds[1]);
    std::string szSaid(1000, '\0');
    const ssize_t cb = read(fds[0], szSaid.data(), szSaid.size());
    szSaid.resize(cb < 0 ? 0 : static_cast<size_t>(cb));
    (void)close(fds[0]);
    int status = 0;
    ASSERT_EQ(waitpid(pid, &status, 0), pid);
    EXPECT_EQ(szSaid, "arrayctl-rehearse: only root can rehearse: it needs mounts of its own, and "
                      "reads the disks\n");
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 2);
}

// ---- what the machine lacks
// ----------------------------------------------------------------------

// A file system of a few pages over a folder of the machine, and no page of it is free.
void FolderFill(const std::string &szFolder)
{
    if (unshare(CLONE_NEWNS) != 0 || mount("full", szFolder.c_str(), "tmpfs", 0, "size=16k") != 0) {
        _exit(1);
    }
    const std::array<char, 4096> page = {};
    const int fd = open((szFolder + "/full").c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600);
    while (write(fd, page.data(), page.size()) > 0) {
    }
    (void)close(fd);
}

void TmpFill()
{
    FolderFill("/tmp");
    if (open("/tmp/raid.1", O_WRONLY | O_CREAT | O_CLOEXEC, 0600) < 0) {
        _exit(1);
    }
}

TEST(Unchanged, WithAFullTmp)
{
    MACHINE machine = MachineWithOwnTool("echo more >/tmp/more && test -e /tmp/raid.1 && "
                                         "/sbin/mdadm -S /dev/md2\n");
    machine.prepare = TmpFill;
    const RUN_RESULT result = Unchanged(machine);
    EXPECT_EQ(result.status, 3); // a marker is set
    EXPECT_EQ(result.szErr, "");
    EXPECT_EQ(result.szOut, "/sbin/mdadm -S /dev/md2\n");
}

TEST(Unchanged, WithAToolThatFillsItsTmp)
{
    const RUN_RESULT result = Unchanged(
        MachineWithOwnTool("yes | head -c 100000000 >/tmp/full; yes | head -c 100000000 "
                           ">/var/log/full; echo x >/tmp/more || /sbin/mdadm -S /dev/md2\n"));
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.szOut, "/sbin/mdadm -S /dev/md2\n");
}

void OutputToFullFolder()
{
    FolderFill("/mnt");
    const int fd = open("/mnt/output", O_WRONLY | O_CREAT | O_CLOEXEC, 0600);
    if (fd < 0 || dup2(fd, STDOUT_FILENO) < 0) {
        _exit(1);
    }
}

// Status 0 lets a script go on, so it may not be that when nobody can read what was printed; be
// that less than the stream holds back, or more.
TEST(Unchanged, WithoutRoomForWhatItPrints)
{
    const std::string szLong = "/sbin/mdadm $(yes x | head -n 9000 | tr -d '\\n')\n";
    for (const std::string szForm : {"--commands", "--json"}) {
        for (const std::string &szScript : {std::string("/sbin/mdadm -S /dev/md2\n"), szLong}) {
            SCOPED_TRACE(szForm + " of " + szScript);
            MACHINE machine = MachineWithOwnTool(szScript);
            MachineFolder(machine, "/mnt");
            machine.prepare = OutputToFullFolder;
            ExpectRefusal(Unchanged(machine, szForm),
                          "cannot print the rehearsal: its output cannot be written\n");
        }
    }
}

constexpr const char *CALLS[] = {
    "/sbin/mdadm -S /dev/md2", "/sbin/sfdisk -M1 /dev/sda", "/sbin/pvs --config x",
    "/sbin/lvremove -f a/b",   "/sbin/vgremove -f a",       "/sbin/pvremove -f /dev/md2",
    "/bin/umount -R /mnt",     "/bin/nurodd a b",
};

// The tool finds that it is not there, as it would in the real run; all others are written down.
TEST(Unchanged, WithoutOneOfThePrograms)
{
    std::string szScript;
    for (const char *const szCall : CALLS) {
        szScript += std::string(szCall) + "\n";
    }
    for (const std::string szMissing : CALLS) {
        SCOPED_TRACE(szMissing);
        MACHINE machine = MachineWithOwnTool(szScript);
        machine.tools[szMissing.substr(0, szMissing.find(' '))] = TOOL_KIND::MISSING;
        const RUN_RESULT result = Unchanged(machine);
        std::string szOthers = szScript;
        szOthers.erase(szOthers.find(szMissing), szMissing.size() + 1);
        EXPECT_EQ(result.status, 0);
        EXPECT_EQ(result.szErr, "");
        EXPECT_EQ(result.szOut, szOthers);
    }
}

// ---- two at once
// -----------------------------------------------------------------------------------

// The time of a pipe is that of its last line.
std::vector<std::string> PictureWithoutMeeting()
{
    std::vector<std::string> picture = RehearsalPicture();
    std::erase_if(picture, [](const std::string &szLine) { return szLine.starts_with("/meet."); });
    return picture;
}

// Each tool waits for a line that comes when both are there.
TEST(Unchanged, TwiceAtOnce)
{
    MACHINE machine = MachineWithOwnTool("read -r line <\"/meet.$1\"\n"
                                         "echo \"$1\" >/tmp/left; cat /tmp/left\n"
                                         "/sbin/mdadm -S \"/dev/md$1\"\n");
    machine.fifos = {"/meet.1", "/meet.2"};
    std::string szWords;
    for (const std::string &szWord : RehearsalWords({"--tool", REHEARSAL_OWN_TOOL})) {
        szWords += szWord + " ";
    }
    MachineFile(machine, "/both",
                szWords + "1 >/dev/null 2>&1 & first=$!\n" + szWords +
                    "--commands 2 & second=$!\n" +
                    "exec 3>/meet.1 4>/meet.2; echo go >&3; echo go >&4\n"
                    "wait $first; echo \"first: $?\"; wait $second; echo \"second: $?\"\n");
    (void)MachineTryOther(machine, {"/bin/sh", "-c", ":"});
    const std::vector<std::string> before = PictureWithoutMeeting();
    const RUN_RESULT result = MachineTryOtherAgain(machine, {"/bin/sh", "/both"});
    EXPECT_EQ(RehearsalDifference(before, PictureWithoutMeeting()), "");
    EXPECT_EQ(result.nUnreaped + result.nRunning, 0);
    EXPECT_EQ(LogText(result), "");
    EXPECT_FALSE(result.fTimedOut);
    EXPECT_NE(result.szOut.find("first: 0\n"), std::string::npos);
    EXPECT_NE(result.szOut.find("/sbin/mdadm -S /dev/md2\n"), std::string::npos);
    EXPECT_NE(result.szOut.find("second: 0\n"), std::string::npos);
}

} // namespace
