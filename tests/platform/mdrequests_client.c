// SPDX-License-Identifier: MIT
//
// A program that asks the md driver, as its words say, one after the other:
//
//   open PATH      opens it as descriptor 3
//   close          closes that
//   health, sync   make the request on it and print the answer, or "errno N"
//   null           the first request without a place for the answer
//   size           another request: bytes of the device
//   times N        the first request N times; prints how often the answer was 1
//   files          prints which descriptors are open
//   fork           a child goes on; its parent waits and ends with its status
//   deny CALL E    from now on seccomp or addfd fails with errno E, as on an old kernel
//   exec PROGRAM.. becomes that program
#include <errno.h>
#include <fcntl.h>
#include <linux/filter.h>
#include <linux/fs.h>
#include <linux/major.h>
#include <linux/seccomp.h>
#include <stddef.h>
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/ioctl.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#define FD 3
#define BROKEN 99
#define OPEN_MAX_LOOKED_AT 64

static const unsigned long GET_SYNC = _IOR(MD_MAJOR, 0x60, uint64_t[3]);
static const unsigned long GET_HEALTH = _IOR(MD_MAJOR, 0x61, int32_t);

static void open_as_three(const char *path)
{
    const int fd = open(path, O_RDONLY);
    if (fd != FD && (dup2(fd, FD) != FD || close(fd) != 0)) {
        perror(path);
        exit(BROKEN);
    }
}

static void health(void)
{
    int32_t value[2] = {77, 77};
    if (ioctl(FD, GET_HEALTH, value) != 0) {
        printf("health errno %d\n", errno);
    } else {
        printf("health %d%s\n", value[0], value[1] == 77 ? "" : " and more");
    }
}

static void sync_status(void)
{
    uint64_t value[4] = {77, 77, 77, 77};
    if (ioctl(FD, GET_SYNC, value) != 0) {
        printf("sync errno %d\n", errno);
    } else {
        printf("sync %llu %llu %llu%s\n", (unsigned long long)value[0],
               (unsigned long long)value[1], (unsigned long long)value[2],
               value[3] == 77 ? "" : " and more");
    }
}

static void null(void)
{
    const int result = ioctl(FD, GET_HEALTH, NULL);
    printf("null %d errno %d\n", result, errno);
}

static void size(void)
{
    uint64_t bytes = 77;
    const int result = ioctl(FD, BLKGETSIZE64, &bytes);
    printf("size %d %llu\n", result, (unsigned long long)bytes);
}

static void times(const char *count)
{
    int degraded = 0;
    for (int i = 0; i < atoi(count); i++) {
        int32_t value = 77;
        degraded += ioctl(FD, GET_HEALTH, &value) == 0 && value == 1;
    }
    printf("times %d\n", degraded);
}

static void files(void)
{
    for (int fd = 0; fd < OPEN_MAX_LOOKED_AT; fd++) {
        if (fcntl(fd, F_GETFD) >= 0) {
            printf("file %d\n", fd);
        }
    }
}

static void go_on_in_child(void)
{
    int status = 0;
    const pid_t pid = fork();
    if (pid != 0) {
        exit(waitpid(pid, &status, 0) == pid && WIFEXITED(status) ? WEXITSTATUS(status) : BROKEN);
    }
}

// Both words of the filter's comparison fit every processor that these tests run on.
static void deny(const char *call, const char *error)
{
    const uint32_t refusal = SECCOMP_RET_ERRNO | (uint32_t)atoi(error);
    struct sock_filter whole[] = {
        BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(struct seccomp_data, nr)),
        BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, SYS_seccomp, 0, 1),
        BPF_STMT(BPF_RET | BPF_K, refusal),
        BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW),
    };
    struct sock_filter one_request[] = {
        BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(struct seccomp_data, nr)),
        BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, SYS_ioctl, 0, 3),
        BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(struct seccomp_data, args[1])),
        BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, (uint32_t)SECCOMP_IOCTL_NOTIF_ADDFD, 0, 1),
        BPF_STMT(BPF_RET | BPF_K, refusal),
        BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW),
    };
    const struct sock_fprog filters[] = {
        {sizeof(whole) / sizeof(*whole), whole},
        {sizeof(one_request) / sizeof(*one_request), one_request},
    };
    if (prctl(PR_SET_SECCOMP, SECCOMP_MODE_FILTER, &filters[strcmp(call, "addfd") == 0]) != 0) {
        perror("deny");
        exit(BROKEN);
    }
}

int main(int argc, char **argv)
{
    setvbuf(stdout, NULL, _IONBF, 0);
    for (int i = 1; i < argc; i++) {
        const char *const word = argv[i];
        if (strcmp(word, "open") == 0) {
            open_as_three(argv[++i]);
        } else if (strcmp(word, "close") == 0) {
            close(FD);
        } else if (strcmp(word, "health") == 0) {
            health();
        } else if (strcmp(word, "sync") == 0) {
            sync_status();
        } else if (strcmp(word, "null") == 0) {
            null();
        } else if (strcmp(word, "size") == 0) {
            size();
        } else if (strcmp(word, "times") == 0) {
            times(argv[++i]);
        } else if (strcmp(word, "files") == 0) {
            files();
        } else if (strcmp(word, "fork") == 0) {
            go_on_in_child();
        } else if (strcmp(word, "deny") == 0) {
            deny(argv[i + 1], argv[i + 2]);
            i += 2;
        } else if (strcmp(word, "exec") == 0) {
            execv(argv[i + 1], argv + i + 1);
            perror(argv[i + 1]);
            return BROKEN;
        } else {
            fprintf(stderr, "no word %s\n", word);
            return BROKEN;
        }
    }
    return 0;
}
