// SPDX-License-Identifier: MIT
#include "stage.h"

#include "owner.h"
#include "places.h"
#include "text.h"

#include <array>
#include <cerrno>
#include <climits>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <linux/capability.h>
#include <linux/landlock.h>
#include <linux/magic.h>
#include <string>
#include <sys/auxv.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/sendfile.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/statfs.h>
#include <sys/syscall.h>
#include <sys/un.h>
#include <unistd.h>

namespace
{

constexpr mode_t FOLDER_MODE = 0755;
constexpr mode_t PROGRAM_MODE = 0755;
constexpr unsigned long PRIVATE_FLAGS = MS_NOSUID | MS_NODEV;
constexpr char PRIVATE_OPTIONS[] = "mode=1777,size=64m";

// What the tool looks for in /tmp. It may also write there, so it gets copies.
constexpr const char *MARKERS[] = {".dualhead", ".not.dualhead", "raid.0", "raid.1", "raid.5"};

// Where LVM keeps its locks and hints; it cannot list anything while these are read-only.
constexpr const char *LOCK_FOLDERS[] = {"/run/lock", "/var/lock", "/run/lvm"};

// What may be opened for writing: private folders, and devices that keep nothing. The device mapper
// is asked through its node, too.
constexpr const char *WRITABLE[] = {
    "/tmp",      "/var/log",    "/run/lock", "/var/lock",    "/run/lvm",
    "/dev/null", "/dev/zero",   "/dev/full", "/dev/tty",     "/dev/console",
    "/dev/pts",  "/dev/random", "/dev/ptmx", "/dev/urandom", "/dev/mapper/control",
};

// Rights that nothing needs for a question: rebooting, loading modules, raw ports, device nodes,
// the clock.
constexpr int RIGHTS_DROPPED[] = {CAP_SYS_BOOT, CAP_SYS_MODULE, CAP_SYS_RAWIO, CAP_MKNOD,
                                  CAP_SYS_TIME};

std::string RealPath(const std::string &szPath)
{
    const HEAP_OWNER szReal(realpath(szPath.c_str(), nullptr));
    return szReal == nullptr ? "" : szReal.get();
}

bool IsFolder(const std::string &szPath)
{
    struct stat info = {};
    return stat(szPath.c_str(), &info) == 0 && S_ISDIR(info.st_mode);
}

bool IsProgram(const std::string &szPath)
{
    struct stat info = {};
    return stat(szPath.c_str(), &info) == 0 && S_ISREG(info.st_mode) &&
           access(szPath.c_str(), X_OK) == 0;
}

// --- everything read-only ----------------------------------------------------------------------

bool MountsSeparate()
{
    return mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0 ||
           ComplainErrno("cannot keep its mounts to itself");
}

bool MountsReadOnly()
{
    struct mount_attr attributes = {};
    attributes.attr_set = MOUNT_ATTR_RDONLY;
    if (syscall(SYS_mount_setattr, -1, "/", AT_RECURSIVE, &attributes, sizeof(attributes)) == 0) {
        return true;
    }
    return errno == ENOSYS ? Complain("this kernel cannot make a whole tree of mounts read-only; "
                                      "Linux 5.12 and later can")
                           : ComplainErrno("cannot make the file systems read-only");
}

// Its own list of processes, so that no other one can be found by it. A /proc that is no file
// system of processes stays as it is.
bool ProcessesHide()
{
    struct statfs info = {};
    if (statfs("/proc", &info) != 0 || info.f_type != PROC_SUPER_MAGIC) {
        return true;
    }
    return mount("proc", "/proc", "proc", PRIVATE_FLAGS | MS_NOEXEC | MS_RDONLY, nullptr) == 0 ||
           ComplainErrno("cannot mount a /proc of its own");
}

bool FolderPrivate(const char *szFolder)
{
    return mount(PROGRAM_NAME, szFolder, "tmpfs", PRIVATE_FLAGS, PRIVATE_OPTIONS) == 0 ||
           ComplainErrno("cannot lay a private folder over %s", szFolder);
}

// --- /tmp with its markers ---------------------------------------------------------------------

bool FileCopy(int fdFrom, int fdTo, const struct stat &info)
{
    off_t cbLeft = info.st_size;
    while (cbLeft > 0) {
        const ssize_t cb = sendfile(fdTo, fdFrom, nullptr, static_cast<size_t>(cbLeft));
        if (cb <= 0) {
            return cb == 0;
        }
        cbLeft -= cb;
    }
    return true;
}

bool FileMarkerCopy(int fdOld, int fdNew, const char *szName, const struct stat &info)
{
    constexpr mode_t PERMISSIONS = 07777;
    const DESCRIPTOR from(openat(fdOld, szName, O_RDONLY | O_NOFOLLOW | O_CLOEXEC));
    const DESCRIPTOR to(openat(fdNew, szName, O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
    return from.fd >= 0 && to.fd >= 0 && FileCopy(from.fd, to.fd, info) &&
           fchmod(to.fd, info.st_mode & PERMISSIONS) == 0;
}

bool LinkMarkerCopy(int fdOld, int fdNew, const char *szName)
{
    std::array<char, PATH_MAX> target = {};
    return readlinkat(fdOld, szName, target.data(), target.size() - 1) >= 0 &&
           symlinkat(target.data(), fdNew, szName) == 0;
}

bool MarkerCopy(int fdOld, int fdNew, const char *szName)
{
    struct stat info = {};
    if (fstatat(fdOld, szName, &info, AT_SYMLINK_NOFOLLOW) != 0) {
        return errno == ENOENT || ComplainErrno("cannot look at the marker /tmp/%s", szName);
    }
    bool fCopied = false;
    if (S_ISREG(info.st_mode)) {
        fCopied = FileMarkerCopy(fdOld, fdNew, szName, info);
    } else if (S_ISLNK(info.st_mode)) {
        fCopied = LinkMarkerCopy(fdOld, fdNew, szName);
    } else {
        // A folder or anything else: that it is there is all that can be asked of it.
        fCopied = mkdirat(fdNew, szName, info.st_mode) == 0;
    }
    return fCopied || ComplainErrno("cannot copy the marker /tmp/%s", szName);
}

bool TmpPrivate()
{
    const DESCRIPTOR old(open(TMP_FOLDER, O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (old.fd < 0) {
        return ComplainErrno("cannot open %s", TMP_FOLDER);
    }
    if (!FolderPrivate(TMP_FOLDER)) {
        return false;
    }
    const DESCRIPTOR made(open(TMP_FOLDER, O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (made.fd < 0) {
        return ComplainErrno("cannot open %s", TMP_FOLDER);
    }
    for (const char *const szMarker : MARKERS) {
        if (!MarkerCopy(old.fd, made.fd, szMarker)) {
            return false;
        }
    }
    return true;
}

// Several of these may be the same folder.
bool FoldersPrivate()
{
    WORDS covered;
    for (const char *const szFolder : LOCK_FOLDERS) {
        const std::string szReal = RealPath(szFolder);
        if (szReal.empty() || !IsFolder(szReal) || IsOneOf(covered, szReal)) {
            continue;
        }
        covered.push_back(szReal);
        if (!FolderPrivate(szReal.c_str())) {
            return false;
        }
    }
    return !IsFolder(LOG_FOLDER) || FolderPrivate(LOG_FOLDER);
}

// --- the recorder ------------------------------------------------------------------------------

// This program itself, by the path that it was started with.
int SelfOpen()
{
    const auto szSelf = reinterpret_cast<const char *>(getauxval(AT_EXECFN));
    const int fdSelf = open(szSelf, O_RDONLY | O_CLOEXEC);
    if (fdSelf < 0) {
        (void)ComplainErrno("cannot open %s", szSelf);
    }
    return fdSelf;
}

bool RecorderCopy(int fdSelf)
{
    const DESCRIPTOR to(open(RECORDER_PATH, O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, PROGRAM_MODE));
    struct stat info = {};
    return (to.fd >= 0 && fstat(fdSelf, &info) == 0 && FileCopy(fdSelf, to.fd, info) &&
            fchmod(to.fd, PROGRAM_MODE) == 0) ||
           ComplainErrno("cannot make the recorder");
}

// Makes what is at a path reachable at another one, whatever is laid over the first.
bool FileKeep(const std::string &szPath, const std::string &szKept)
{
    const DESCRIPTOR made(open(szKept.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, PROGRAM_MODE));
    return (made.fd >= 0 &&
            mount(szPath.c_str(), szKept.c_str(), nullptr, MS_BIND, nullptr) == 0) ||
           ComplainErrno("cannot keep %s at hand", szPath.c_str());
}

// Where several programs are one file, it is covered once.
bool RecorderLay()
{
    const std::string szShell = RealPath("/bin/sh");
    WORDS covered;
    for (const PROGRAM &program : PROGRAMS) {
        if (IsProgram(program.szPath) &&
            !FileKeep(program.szPath, std::string(REAL_FOLDER) + "/" + program.szName)) {
            return false;
        }
    }
    for (const PROGRAM &program : PROGRAMS) {
        const std::string szReal = RealPath(program.szPath);
        if (!IsProgram(szReal) || IsOneOf(covered, szReal)) {
            continue;
        }
        covered.push_back(szReal);
        if (szReal == szShell && !FileKeep(szShell, REAL_SHELL_PATH)) {
            return false;
        }
        if (mount(RECORDER_PATH, szReal.c_str(), nullptr, MS_BIND, nullptr) != 0) {
            return ComplainErrno("cannot lay the recorder over %s", program.szPath);
        }
    }
    return true;
}

bool SocketBind(int fdSocket, const char *szPath)
{
    constexpr mode_t ANYBODY = 0666;
    struct sockaddr_un address = {};
    address.sun_family = AF_UNIX;
    strncpy(address.sun_path, szPath, sizeof(address.sun_path) - 1);
    return (bind(fdSocket, reinterpret_cast<const struct sockaddr *>(&address), sizeof(address)) ==
                0 &&
            chmod(szPath, ANYBODY) == 0) ||
           ComplainErrno("cannot make the socket %s", szPath);
}

bool SyslogReplace(int fdSyslog)
{
    struct stat info = {};
    if (stat(SYSLOG_PATH, &info) != 0) {
        return true;
    }
    return SocketBind(fdSyslog, LOG_SOCKET_PATH) &&
           (mount(LOG_SOCKET_PATH, SYSLOG_PATH, nullptr, MS_BIND, nullptr) == 0 ||
            ComplainErrno("cannot take the place of the system log"));
}

bool ToolKeep(int fdTool)
{
    const DESCRIPTOR made(open(TOOL_PATH, O_WRONLY | O_CREAT | O_CLOEXEC, PROGRAM_MODE));
    return (made.fd >= 0 &&
            move_mount(fdTool, "", AT_FDCWD, TOOL_PATH, MOVE_MOUNT_F_EMPTY_PATH) == 0) ||
           ComplainErrno("cannot keep the tool at hand");
}

bool PrivateFolderMake()
{
    return (mkdir(PRIVATE_FOLDER, FOLDER_MODE) == 0 ||
            ComplainErrno("cannot make %s", PRIVATE_FOLDER)) &&
           FolderPrivate(PRIVATE_FOLDER) &&
           (mkdir(REAL_FOLDER, FOLDER_MODE) == 0 || ComplainErrno("cannot make %s", REAL_FOLDER));
}

// The whole file system, so the recorder is read-only wherever it lies.
bool PrivateFolderSeal()
{
    return mount(nullptr, PRIVATE_FOLDER, nullptr, MS_REMOUNT | MS_RDONLY | PRIVATE_FLAGS,
                 nullptr) == 0 ||
           ComplainErrno("cannot make %s read-only", PRIVATE_FOLDER);
}

// --- what the kernel promises ------------------------------------------------------------------

bool WritableAdd(int fdRules, const char *szPath)
{
    const DESCRIPTOR place(open(szPath, O_PATH | O_CLOEXEC));
    struct landlock_path_beneath_attr rule = {};
    rule.allowed_access = LANDLOCK_ACCESS_FS_WRITE_FILE;
    rule.parent_fd = place.fd;
    return place.fd < 0 ||
           syscall(SYS_landlock_add_rule, fdRules, LANDLOCK_RULE_PATH_BENEATH, &rule, 0) == 0;
}

// 1, 0 on a kernel without it, -1 on failure.
int WritingForbid()
{
    struct landlock_ruleset_attr attributes = {};
    attributes.handled_access_fs = LANDLOCK_ACCESS_FS_WRITE_FILE;
    const DESCRIPTOR rules(
        static_cast<int>(syscall(SYS_landlock_create_ruleset, &attributes, sizeof(attributes), 0)));
    if (rules.fd < 0) {
        return errno == ENOSYS || errno == EOPNOTSUPP ? 0 : -1;
    }
    for (const char *const szPath : WRITABLE) {
        if (!WritableAdd(rules.fd, szPath)) {
            return -1;
        }
    }
    return syscall(SYS_landlock_restrict_self, rules.fd, 0) == 0 ? 1 : -1;
}

} // namespace

bool StageSetUp(const char *szTool, int fdJournal, int fdSyslog)
{
    // Both may lie in /tmp, or in the working folder, so they are held before these are left.
    const DESCRIPTOR self(SelfOpen());
    if (self.fd < 0 || !MountsSeparate() || !MountsReadOnly()) {
        return false;
    }
    const DESCRIPTOR tool(open_tree(AT_FDCWD, szTool, OPEN_TREE_CLONE | OPEN_TREE_CLOEXEC));
    if (tool.fd < 0) {
        return ComplainErrno("cannot keep %s at hand", szTool);
    }
    return (chdir("/") == 0 || ComplainErrno("cannot leave the working folder")) &&
           ProcessesHide() && TmpPrivate() && FoldersPrivate() && PrivateFolderMake() &&
           RecorderCopy(self.fd) && ToolKeep(tool.fd) && RecorderLay() &&
           SocketBind(fdJournal, JOURNAL_PATH) && SyslogReplace(fdSyslog) && PrivateFolderSeal();
}

int StageClose()
{
    if (prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) != 0) {
        (void)ComplainErrno("cannot give up rights");
        return -1;
    }
    for (const int right : RIGHTS_DROPPED) {
        if (prctl(PR_CAPBSET_DROP, right, 0, 0, 0) != 0 && errno != EINVAL) {
            (void)ComplainErrno("cannot give up rights");
            return -1;
        }
    }
    const int promised = WritingForbid();
    if (promised < 0) {
        (void)ComplainErrno("cannot forbid writing to block devices");
    }
    return promised;
}
