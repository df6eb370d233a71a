// SPDX-License-Identifier: MIT
#include "private_root.h"

#include "wire.h"
#include "words.h"

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <ftw.h>
#include <linux/mount.h>
#include <sched.h>
#include <sstream>
#include <sys/mount.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/un.h>
#include <unistd.h>

namespace
{

std::string g_szRoot;
int g_fdLog = -1;

constexpr const char *HOST_FOLDERS[] = {"/usr", "/lib", "/lib32", "/lib64", "/libx32"};
constexpr const char *ROOM_FOLDERS[] = {"/bin", "/dev", "/sbin", WIRE_FOLDER, WIRE_PROC};
constexpr const char *TOOL_PATHS[] = {
    "/sbin/mdadm",    "/sbin/sfdisk",   "/sbin/pvs",   "/sbin/lvremove",
    "/sbin/vgremove", "/sbin/pvremove", "/bin/umount", "/bin/nurodd",
};

// The host's shell, unless the machine has another.
constexpr const char *SHELL_PATH = "/bin/sh";

// What survives the emptying of the private root, folder by folder.
const std::set<std::string> KEPT_TOP = {"usr", "lib", "lib32", "lib64",   "libx32",
                                        "bin", "dev", "sbin",  ".sandbox"};
const std::set<std::string> KEPT_DEV = {"null", "log", "log.away"};

constexpr const char *HINT =
    "; this kernel or container refuses what the sandbox needs: run the suite in the virtual "
    "appliance";

[[noreturn]] void Die(const std::string &szWhat)
{
    fprintf(stderr, "sandbox: %s: %s\n", szWhat.c_str(), strerror(errno));
    abort();
}

std::string Inside(const std::string &szPath)
{
    return g_szRoot + szPath;
}

// Opened as the flags say. False when it could not be written, as a whole.
bool BytesWrite(const std::string &szPath, std::string_view szText, int flags)
{
    const int fd = open(szPath.c_str(), O_WRONLY | O_CLOEXEC | flags, 0600);
    const bool fDone =
        fd >= 0 && write(fd, szText.data(), szText.size()) == static_cast<ssize_t>(szText.size());
    if (fd >= 0) {
        close(fd);
    }
    return fDone;
}

void TextWrite(const std::string &szPath, std::string_view szText, mode_t mode)
{
    if (!BytesWrite(szPath, szText, O_CREAT | O_TRUNC) || chmod(szPath.c_str(), mode) != 0) {
        Die("write " + szPath);
    }
}

void FoldersMake(const std::string &szFolder)
{
    for (size_t i = szFolder.find('/', 1); i != std::string::npos; i = szFolder.find('/', i + 1)) {
        (void)mkdir(Inside(szFolder.substr(0, i)).c_str(), 0755);
    }
    if (mkdir(Inside(szFolder).c_str(), 0755) != 0 && errno != EEXIST) {
        Die("mkdir " + szFolder);
    }
}

std::string ParentOf(const std::string &szPath)
{
    return szPath.substr(0, std::max<size_t>(szPath.rfind('/'), 1));
}

// ---- entering ----------------------------------------------------------------------------------

std::string Refused(const std::string &szWhat)
{
    return szWhat + ": " + strerror(errno) + HINT;
}

std::string NamespacesEnter()
{
    const std::string szUser = std::to_string(getuid());
    const std::string szGroup = std::to_string(getgid());
    if (unshare(CLONE_NEWUSER | CLONE_NEWNS) != 0) {
        return Refused("unshare of the user and mount namespaces");
    }
    (void)BytesWrite("/proc/self/setgroups", "deny", 0);
    if (!BytesWrite("/proc/self/uid_map", "0 " + szUser + " 1", 0) ||
        !BytesWrite("/proc/self/gid_map", "0 " + szGroup + " 1", 0)) {
        return Refused("map of the user namespace");
    }
    if (mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0) {
        return Refused("private mounts");
    }
    return "";
}

void RootRemove()
{
    (void)umount2(g_szRoot.c_str(), MNT_DETACH);
    (void)rmdir(g_szRoot.c_str());
}

std::string RootMount()
{
    if (mount("sandbox", g_szRoot.c_str(), "tmpfs", 0, "mode=755,size=512m") != 0) {
        return Refused("tmpfs");
    }
    for (const char *const szFolder : ROOM_FOLDERS) {
        FoldersMake(szFolder);
    }
    return "";
}

std::string Bind(const std::string &szPath)
{
    return mount(szPath.c_str(), Inside(szPath).c_str(), nullptr, MS_BIND | MS_REC, nullptr) == 0
               ? ""
               : Refused("bind of " + szPath);
}

std::string ReadOnlyBind(const std::string &szFolder)
{
    FoldersMake(szFolder);
    const std::string szRefused = Bind(szFolder);
    struct mount_attr attributes = {};
    attributes.attr_set = MOUNT_ATTR_RDONLY;
    if (szRefused.empty() && syscall(SYS_mount_setattr, -1, Inside(szFolder).c_str(), AT_RECURSIVE,
                                     &attributes, sizeof(attributes)) != 0) {
        return Refused("read-only bind of " + szFolder);
    }
    return szRefused;
}

// The host's libraries and programs; a folder that is a link on the host is the same link inside.
std::string HostFoldersBind()
{
    for (const std::string szFolder : HOST_FOLDERS) {
        struct stat info = {};
        char szTarget[256] = "";
        if (lstat(szFolder.c_str(), &info) != 0) {
            continue;
        }
        if (S_ISLNK(info.st_mode)) {
            (void)!readlink(szFolder.c_str(), szTarget, sizeof(szTarget) - 1);
            (void)!symlink(szTarget, Inside(szFolder).c_str());
            continue;
        }
        const std::string szRefused = ReadOnlyBind(szFolder);
        if (!szRefused.empty()) {
            return szRefused;
        }
    }
    return "";
}

std::string NullBind()
{
    TextWrite(Inside("/dev/null"), "", 0666);
    return Bind("/dev/null");
}

std::string FromEnvironment(const char *szName, const char *szDefault)
{
    const char *const sz = getenv(szName);
    return sz != nullptr && *sz != '\0' ? sz : szDefault;
}

// Programs that count what runs save the counts in their folder, wherever they run.
std::string CoverageBind()
{
    const std::string szFolder = FromEnvironment("ARRAYCTL_COVERAGE", "");
    if (szFolder.empty()) {
        return "";
    }
    FoldersMake(szFolder);
    return Bind(szFolder);
}

std::string FileCopy(const std::string &szFrom, const std::string &szTo)
{
    const std::optional<std::string> bytes = FileText(szFrom);
    if (!bytes) {
        return "cannot read " + szFrom + ": " + strerror(errno);
    }
    TextWrite(Inside(szTo), *bytes, 0755);
    return "";
}

std::string ProgramsCopy()
{
    const struct {
        std::string szFrom;
        std::string szTo;
    } copies[] = {
        {FromEnvironment("ARRAYCTL_BINARY", ARRAYCTL_BINARY), WIRE_PROGRAM},
        {FromEnvironment("ARRAYCTL_INTERPOSE", SANDBOX_INTERPOSE), WIRE_INTERPOSE},
        {SANDBOX_STANDIN, WIRE_STANDIN},
        {"/bin/sh", WIRE_SHELL},
    };
    for (const auto &copy : copies) {
        const std::string szProblem = FileCopy(copy.szFrom, copy.szTo);
        if (!szProblem.empty()) {
            return szProblem;
        }
    }
    const char *const szBodies = getenv("ARRAYCTL_BODIES");
    return szBodies == nullptr ? "" : FileCopy(szBodies, WIRE_BODIES);
}

std::string LogSocketMake()
{
    struct sockaddr_un address = {};
    address.sun_family = AF_UNIX;
    snprintf(address.sun_path, sizeof(address.sun_path), "%s", Inside(WIRE_LOG).c_str());
    g_fdLog = socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
    if (g_fdLog < 0 ||
        bind(g_fdLog, reinterpret_cast<const struct sockaddr *>(&address), sizeof(address)) != 0) {
        return Refused(WIRE_LOG);
    }
    return "";
}

std::string PrivateRootMake()
{
    char szRoot[] = "/tmp/arrayctl-sandbox.XXXXXX";
    if (mkdtemp(szRoot) == nullptr) {
        return Refused("folder for the private root");
    }
    g_szRoot = szRoot;
    (void)atexit(RootRemove);
    using STEP = std::string (*)();
    constexpr STEP STEPS[] = {NamespacesEnter, RootMount,    HostFoldersBind, NullBind,
                              CoverageBind,    ProgramsCopy, LogSocketMake};
    for (const STEP step : STEPS) {
        std::string szRefused = step();
        if (!szRefused.empty()) {
            return szRefused;
        }
    }
    return "";
}

// ---- emptying ----------------------------------------------------------------------------------

int EntryRemove(const char *szPath, const struct stat *, int, struct FTW *)
{
    (void)remove(szPath);
    return 0;
}

// Removes what is in the folder, never leaving its file system, so that nothing that is bound into
// the private root can be reached.
void FolderEmpty(const std::string &szFolder, const std::set<std::string> &kept)
{
    constexpr int DESCRIPTORS = 16;
    for (const std::filesystem::directory_entry &entry :
         std::filesystem::directory_iterator(Inside(szFolder))) {
        if (!kept.contains(entry.path().filename())) {
            (void)nftw(entry.path().c_str(), EntryRemove, DESCRIPTORS,
                       FTW_DEPTH | FTW_MOUNT | FTW_PHYS);
        }
    }
}

void PrivateRootEmpty()
{
    FolderEmpty("/", KEPT_TOP);
    FolderEmpty("/bin", {});
    FolderEmpty("/sbin", {});
    FolderEmpty("/dev", KEPT_DEV);
}

// ---- laying out --------------------------------------------------------------------------------

void ProgramLink(const std::string &szProgram, const std::string &szPath)
{
    if (link(Inside(szProgram).c_str(), Inside(szPath).c_str()) != 0) {
        Die("link " + szPath);
    }
}

void ToolLayOut(const std::string &szPath, TOOL_KIND kind)
{
    FoldersMake(ParentOf(szPath));
    switch (kind) {
    case TOOL_KIND::STANDIN:
        ProgramLink(WIRE_STANDIN, szPath);
        return;
    case TOOL_KIND::MISSING:
        return;
    case TOOL_KIND::FOLDER:
        FoldersMake(szPath);
        return;
    case TOOL_KIND::NOT_EXECUTABLE:
        TextWrite(Inside(szPath), "#!/bin/sh\n", 0644);
        return;
    }
}

void ToolsLayOut(const MACHINE &machine)
{
    std::map<std::string, TOOL_KIND> tools = machine.tools;
    for (const char *const szPath : TOOL_PATHS) {
        tools.emplace(szPath, TOOL_KIND::STANDIN);
    }
    for (const auto &[szPath, kind] : tools) {
        ToolLayOut(szPath, kind);
    }
    if (!tools.contains(SHELL_PATH)) {
        FoldersMake(ParentOf(SHELL_PATH));
        ProgramLink(WIRE_SHELL, SHELL_PATH);
    }
}

void LogLayOut(bool fNoLog)
{
    const std::string szHere = Inside(WIRE_LOG);
    const std::string szAway = Inside(WIRE_LOG_AWAY);
    (void)(fNoLog ? rename(szHere.c_str(), szAway.c_str())
                  : rename(szAway.c_str(), szHere.c_str()));
}

#ifdef SANDBOX_SANITIZED
// A sanitizer looks at its own process below /proc by number; runs have small numbers.
void ProcLinksLayOut()
{
    constexpr int PROCESS_NUMBERS = 32;
    FoldersMake("/proc");
    (void)!symlink(WIRE_PROC "/self", Inside("/proc/self").c_str());
    for (int pid = 1; pid <= PROCESS_NUMBERS; pid++) {
        const std::string szPid = std::to_string(pid);
        (void)!symlink((WIRE_PROC "/" + szPid).c_str(), Inside("/proc/" + szPid).c_str());
    }
}
#endif

// ---- what stand-ins and driver answer -----------------------------------------------------------

void FieldAdd(std::string &szRecord, std::string_view szText)
{
    szRecord += std::to_string(szText.size());
    szRecord += ':';
    szRecord += szText;
}

template <typename NUMBER>
void NumberAdd(std::string &szRecord, NUMBER number)
{
    FieldAdd(szRecord, std::to_string(number));
}

std::string RowRecord(const TOOL_ROW &row)
{
    std::string szRecord;
    NumberAdd(szRecord, row.answer.nTimes);
    FieldAdd(szRecord, row.answer.szWhileThere);
    NumberAdd(szRecord, row.argv.size());
    for (const std::string &szArgument : row.argv) {
        FieldAdd(szRecord, szArgument);
    }
    FieldAdd(szRecord, row.answer.szOut);
    FieldAdd(szRecord, row.answer.szErr);
    NumberAdd(szRecord, row.answer.status);
    NumberAdd(szRecord, row.answer.signal);
    NumberAdd(szRecord, row.answer.signalCaller);
    NumberAdd(szRecord, row.answer.msDelay);
    NumberAdd(szRecord, row.answer.nMeet);
    NumberAdd(szRecord, row.answer.cbFlood);
    NumberAdd(szRecord, row.answer.msGrandchild);
    NumberAdd(szRecord, row.answer.writes.size());
    for (const auto &[szPath, szText] : row.answer.writes) {
        FieldAdd(szRecord, szPath);
        FieldAdd(szRecord, szText);
    }
    NumberAdd(szRecord, row.answer.removes.size());
    for (const std::string &szPath : row.answer.removes) {
        FieldAdd(szRecord, szPath);
    }
    return szRecord;
}

// In the order of the driver's record; what the program has no use for is 0.
void ArrayTell(std::ostream &driver, const MACHINE_MD &md)
{
    driver << "device /dev/md" << md.nMd << ' ' << md.deviceMajor << ' '
           << md.deviceMinor.value_or(static_cast<unsigned int>(md.nMd)) << "\narray "
           << md.errnoInfo << ' ' << md.majorVersion << ' ' << md.minorVersion << " 0 0 "
           << md.level << ' ' << md.size << " 0 " << md.nRaidDisks << ' ' << md.nMd << " 0 0 1 "
           << md.nActiveDisks << " 0 0 " << md.nSpareDisks << " 0 0\nsize " << md.errnoSize << ' '
           << md.arraySize << "\nhealth " << md.errnoHealth << ' ' << md.health << "\nsync "
           << md.errnoSync << ' ' << md.activity << ' ' << md.done << ' ' << md.total << '\n';
}

std::string DriverText(const MACHINE &machine)
{
    std::ostringstream driver;
    for (const MACHINE_MD &md : machine.arrays) {
        ArrayTell(driver, md);
    }
    for (const MACHINE_DEVICE_SIZE &node : machine.deviceSizes) {
        driver << "device " << node.szPath << " 8 0\nsize " << node.errnoSize << ' ' << node.cb
               << '\n';
    }
    for (const MACHINE_FAULT &fault : machine.faults) {
        driver << "fault " << fault.szFunction << ' ' << fault.nCall << ' ' << fault.error << ' '
               << fault.fGoOn << ' ' << fault.szProcess << '\n';
    }
    driver << "time " << machine.when << '\n'
           << (machine.fCallsTold ? "calls\n" : "") << (machine.fRealSleep ? "realsleep\n" : "");
    return driver.str();
}

} // namespace

void PrivateRootEnter()
{
    static const std::string szRefused = PrivateRootMake();
    if (!szRefused.empty()) {
        (void)fflush(stdout);
        (void)fprintf(stderr, "sandbox: %s\n", szRefused.c_str());
        exit(EXIT_FAILURE);
    }
}

const std::string &PrivateRootFolder()
{
    return g_szRoot;
}

int PrivateRootLogSocket()
{
    return g_fdLog;
}

void PrivateRootAnswersWrite(const MACHINE &machine)
{
    std::string szRows;
    for (const TOOL_ROW &row : machine.rows) {
        FieldAdd(szRows, RowRecord(row));
    }
    TextWrite(Inside(WIRE_ROWS), szRows, 0644);
    TextWrite(Inside(WIRE_USED), std::string(machine.rows.size() * sizeof(std::uint32_t), '\0'),
              0644);
    TextWrite(Inside(WIRE_DRIVER), DriverText(machine), 0644);
    TextWrite(Inside(WIRE_MEETING), "", 0666);
    TextWrite(Inside(WIRE_CALLS), "", 0666);
    LogLayOut(machine.fNoLog);
}

void PrivateRootLayOut(const MACHINE &machine)
{
    PrivateRootEmpty();
#ifdef SANDBOX_SANITIZED
    ProcLinksLayOut();
#endif
    for (const std::string &szFolder : machine.folders) {
        FoldersMake(szFolder);
    }
    for (const auto &[szPath, file] : machine.files) {
        FoldersMake(ParentOf(szPath));
        TextWrite(Inside(szPath), file.szText, file.mode);
    }
    for (const auto &[szPath, szTarget] : machine.links) {
        FoldersMake(ParentOf(szPath));
        if (symlink(szTarget.c_str(), Inside(szPath).c_str()) != 0) {
            Die("symlink " + szPath);
        }
    }
    for (const std::string &szPath : machine.fifos) {
        FoldersMake(ParentOf(szPath));
        if (mkfifo(Inside(szPath).c_str(), 0644) != 0) {
            Die("mkfifo " + szPath);
        }
    }
    ToolsLayOut(machine);
    PrivateRootAnswersWrite(machine);
}
