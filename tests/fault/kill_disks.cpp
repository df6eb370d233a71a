// SPDX-License-Identifier: MIT
//
// The tools of a machine that remembers: which partitions exist, which carry a superblock, which
// arrays run, what of a volume is left. The state is in files:
//
//     /sys/block/sda/sda1/{start,size}    a partition
//     /sys/block/md2/md/dev-sda3          a member of a running array, whose node is /dev/md2
//     /state/superblock/sda3              the number of the array that the partition belongs to
//     /state/{lv,vg,pv}                   what is left of the volume on md2

#include <algorithm>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace
{

constexpr int PARTITIONS = 8;
constexpr unsigned long long DISK_SECTORS = 12582912;
constexpr size_t PATH_SIZE = 256;

struct PATH {
    char sz[PATH_SIZE];
};

__attribute__((format(printf, 1, 2))) PATH Path(const char *szFormat, ...)
{
    PATH path;
    va_list arguments;
    va_start(arguments, szFormat);
    vsnprintf(path.sz, sizeof(path.sz), szFormat, arguments);
    va_end(arguments);
    return path;
}

bool Exists(const PATH &path)
{
    return access(path.sz, F_OK) == 0;
}

void TextWrite(const PATH &path, const char *szText)
{
    const int fd = open(path.sz, O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
    (void)!write(fd, szText, strlen(szText));
    close(fd);
}

unsigned long long NumberRead(const PATH &path)
{
    char ach[32] = "";
    const int fd = open(path.sz, O_RDONLY | O_CLOEXEC);
    (void)!read(fd, ach, sizeof(ach) - 1);
    close(fd);
    return strtoull(ach, nullptr, 10);
}

const char *NameOf(const char *szDevice)
{
    return strncmp(szDevice, "/dev/", 5) == 0 ? szDevice + 5 : szDevice;
}

// The text behind an option of one letter, such as "-j2048".
const char *OptionOf(char *const argv[], const char *szOption, const char *szDefault)
{
    for (; *argv != nullptr; argv++) {
        if (strncmp(*argv, szOption, strlen(szOption)) == 0) {
            return *argv + strlen(szOption);
        }
    }
    return szDefault;
}

// ---- the partitioner ---------------------------------------------------------------------------

PATH PartitionFolder(const char *szDisk, int n)
{
    return Path("/sys/block/%s/%s%d", szDisk, szDisk, n);
}

void PartitionRemove(const char *szDisk, int n)
{
    const PATH folder = PartitionFolder(szDisk, n);
    (void)unlink(Path("/dev/%s%d", szDisk, n).sz);
    (void)unlink(Path("%s/start", folder.sz).sz);
    (void)unlink(Path("%s/size", folder.sz).sz);
    (void)rmdir(folder.sz);
}

unsigned long long PartitionEnd(const char *szDisk, int n)
{
    const PATH folder = PartitionFolder(szDisk, n);
    return n < 1 ? 0
                 : NumberRead(Path("%s/start", folder.sz)) + NumberRead(Path("%s/size", folder.sz));
}

int PartitionList(const char *szDisk, int n)
{
    const PATH folder = PartitionFolder(szDisk, n);
    if (Exists(Path("%s/size", folder.sz))) {
        const unsigned long long start = NumberRead(Path("%s/start", folder.sz));
        const unsigned long long size = NumberRead(Path("%s/size", folder.sz));
        printf("/dev/%s%d  %llu %llu %llu fd\n", szDisk, n, start, start + size - 1, size);
    }
    return 0;
}

int PartitionMake(const char *szDisk, int n, char *const argv[])
{
    const unsigned long long start =
        PartitionEnd(szDisk, n - 1) + strtoull(OptionOf(argv, "-j", "0"), nullptr, 10);
    const char *const szSize = OptionOf(argv, "-z", "-1");
    const unsigned long long size =
        *szSize == '-' ? DISK_SECTORS - start : strtoull(szSize, nullptr, 10);
    const PATH folder = PartitionFolder(szDisk, n);
    (void)mkdir(folder.sz, 0755);
    TextWrite(Path("%s/start", folder.sz), Path("%llu\n", start).sz);
    TextWrite(Path("%s/size", folder.sz), Path("%llu\n", size).sz);
    TextWrite(Path("/dev/%s%d", szDisk, n), "");
    return 0;
}

int RangeDelete(const char *szRange, const char *szDisk)
{
    int first = 1;
    int last = PARTITIONS;
    (void)sscanf(szRange, "%d:%d", &first, &last);
    for (int n = std::max(first, 1); n <= std::min(last, PARTITIONS); n++) {
        PartitionRemove(szDisk, n);
    }
    return 0;
}

int Sfdisk(int argc, char *const argv[])
{
    const char *const szDisk = NameOf(argv[argc - 1]);
    const int n = atoi(OptionOf(argv, "-N", "0"));
    if (strcmp(argv[1], "--fast-delete") == 0) {
        return RangeDelete(argv[2], szDisk);
    }
    if (strcmp(argv[1], "-l") == 0) {
        return PartitionList(szDisk, n);
    }
    return n > 0 ? PartitionMake(szDisk, n, argv) : 0;
}

// ---- arrays ------------------------------------------------------------------------------------

PATH Superblock(const char *szDevice)
{
    return Path("/state/superblock/%s", NameOf(szDevice));
}

PATH ArrayFolder(int nMd)
{
    return Path("/sys/block/md%d/md", nMd);
}

void MemberRemove(const PATH &folder)
{
    (void)unlink(Path("%s/state", folder.sz).sz);
    (void)unlink(Path("%s/slot", folder.sz).sz);
    (void)rmdir(folder.sz);
}

int ArrayStop(int nMd)
{
    const PATH folder = ArrayFolder(nMd);
    DIR *const pFolder = opendir(folder.sz);
    if (pFolder == nullptr || (nMd == 2 && Exists(Path("/state/lv")))) {
        fprintf(stderr, "mdadm: cannot stop it\n");
        return 1;
    }
    for (struct dirent *p = readdir(pFolder); p != nullptr; p = readdir(pFolder)) {
        if (strncmp(p->d_name, "dev-", 4) == 0) {
            MemberRemove(Path("%s/%s", folder.sz, p->d_name));
        }
    }
    (void)closedir(pFolder);
    (void)unlink(Path("/dev/md%d", nMd).sz);
    (void)unlink(Path("%s/sync_action", folder.sz).sz);
    (void)unlink(Path("%s/component_size", folder.sz).sz);
    (void)rmdir(folder.sz);
    (void)rmdir(Path("/sys/block/md%d", nMd).sz);
    return 0;
}

int ArrayMake(int nMd, int argc, char *const argv[])
{
    const PATH folder = ArrayFolder(nMd);
    if (Exists(Path("/dev/md%d", nMd))) {
        return 1;
    }
    (void)mkdir(Path("/sys/block/md%d", nMd).sz, 0755);
    (void)mkdir(folder.sz, 0755);
    for (int i = 3; i < argc; i++) {
        if (strncmp(argv[i], "/dev/sd", 7) == 0) {
            TextWrite(Superblock(argv[i]), Path("%d\n", nMd).sz);
            const PATH member = Path("%s/dev-%s", folder.sz, NameOf(argv[i]));
            (void)mkdir(member.sz, 0755);
            TextWrite(Path("%s/state", member.sz), "in_sync\n");
            TextWrite(Path("%s/slot", member.sz), "0\n");
        }
    }
    TextWrite(Path("/dev/md%d", nMd), "");
    return 0;
}

int Examine(const char *szDevice)
{
    const PATH superblock = Superblock(szDevice);
    if (!Exists(superblock)) {
        fprintf(stderr, "mdadm: No md superblock detected on %s.\n", szDevice);
        return 1;
    }
    const unsigned long long nMd = NumberRead(superblock);
    printf("%s:\n        Version : 1.2\n     Array UUID : 1:2:3:%llu\n           Name : box:%llu\n",
           szDevice, nMd, nMd);
    return 0;
}

int NumberOf(const char *szMd)
{
    return atoi(szMd + strlen("/dev/md"));
}

int Mdadm(int argc, char *const argv[])
{
    if (strcmp(argv[1], "-S") == 0) {
        return ArrayStop(NumberOf(argv[2]));
    }
    if (strcmp(argv[1], "-C") == 0) {
        return ArrayMake(NumberOf(argv[2]), argc, argv);
    }
    return strcmp(argv[1], "-E") == 0 ? Examine(argv[2]) : -unlink(Superblock(argv[2]).sz);
}

// ---- volumes and mounts ------------------------------------------------------------------------

int Pvs(int /*argc*/, char *const /*argv*/[])
{
    if (Exists(Path("/state/pv"))) {
        printf("  /dev/md2:%s:%s:\n", Exists(Path("/state/vg")) ? "vg1" : "",
               Exists(Path("/state/lv")) ? "lv1" : "");
    }
    return 0;
}

int Lvremove(int /*argc*/, char *const /*argv*/[])
{
    return unlink("/state/lv") == 0 ? 0 : 5;
}

int Vgremove(int /*argc*/, char *const /*argv*/[])
{
    return unlink("/state/vg") == 0 ? 0 : 5;
}

int Pvremove(int /*argc*/, char *const /*argv*/[])
{
    return unlink("/state/pv") == 0 ? 0 : 5;
}

// The machine has one mount on the volume.
int Umount(int /*argc*/, char *const /*argv*/[])
{
    TextWrite(Path("/proc/mounts.new"), "rootfs / rootfs rw 0 0\n");
    return rename("/proc/mounts.new", "/proc/mounts") == 0 ? 0 : 32;
}

int Nothing(int /*argc*/, char *const /*argv*/[])
{
    return 0;
}

struct TOOL {
    const char *szName;
    int (*pRun)(int argc, char *const argv[]);
};

constexpr TOOL TOOLS[] = {
    {"sfdisk", Sfdisk},     {"mdadm", Mdadm},       {"pvs", Pvs},       {"lvremove", Lvremove},
    {"vgremove", Vgremove}, {"pvremove", Pvremove}, {"umount", Umount}, {"nurodd", Nothing},
};

} // namespace

int main(int argc, char *argv[])
{
    const char *const szName = strrchr(argv[0], '/') + 1;
    for (const TOOL &tool : TOOLS) {
        if (argc > 1 && strcmp(tool.szName, szName) == 0) {
            const int status = tool.pRun(argc, argv);
            return fflush(stdout) == 0 ? status : 1;
        }
    }
    return szName[0] == 'n' ? 0 : 2;
}
