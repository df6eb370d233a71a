// SPDX-License-Identifier: MIT
//
// The form for a person, of machines that exist as records alone.
#include "print.h"
#include "scene.h"

#include <cstdio>
#include <gtest/gtest.h>
#include <pty.h>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

const WORDS ALL_ANEW = {"/sbin/sfdisk --fast-delete -1 /dev/sda", "/sbin/sfdisk -M1 /dev/sda",
                        "/sbin/sfdisk -N1 -uS -q -f -j2048 -z4980480 -tfd -F /dev/sda",
                        "/sbin/sfdisk -N2 -uS -q -f -j0 -z4194304 -tfd -F /dev/sda"};

void Print(const INVENTORY &inventory, const WORDS &lines)
{
    const OPTIONS options = {.szTool = "/sbin/arrayctl",
                             .szToolPath = "/sbin/arrayctl",
                             .form = FORM::TEXT,
                             .words = {"initsys"},
                             .fHelp = false};
    const HOST host = {};
    const RUN run = RunOf(lines);
    const OUTCOME outcome = OutcomeOf(inventory, run);
    ScenePrint(
        {.options = options, .host = host, .run = run, .inventory = inventory, .outcome = outcome},
        {});
    (void)fflush(stdout);
}

// What a terminal shows, without its carriage returns.
std::string ShownOnTerminal(const INVENTORY &inventory, const WORDS &lines)
{
    (void)fflush(stdout);
    int fd = -1;
    const pid_t pid = forkpty(&fd, nullptr, nullptr, nullptr);
    if (pid == 0) {
        Print(inventory, lines);
        _exit(0);
    }
    std::string szShown;
    char byte = 0;
    while (read(fd, &byte, 1) == 1) {
        if (byte != '\r') {
            szShown += byte;
        }
    }
    (void)close(fd);
    EXPECT_EQ(waitpid(pid, nullptr, 0), pid);
    return szShown;
}

std::string Printed(const INVENTORY &inventory, const WORDS &lines)
{
    testing::internal::CaptureStdout();
    Print(inventory, lines);
    return testing::internal::GetCapturedStdout();
}

// The lines below the first one of these words, up to an empty one.
std::string Part(const std::string &szText, const std::string &szTitle)
{
    const size_t title = szText.find(szTitle);
    if (title == std::string::npos) {
        return "no " + szTitle;
    }
    const size_t begin = szText.find('\n', title) + 1;
    return szText.substr(begin, szText.find("\n\n", begin) + 1 - begin);
}

INVENTORY WithDisk(const DISK &disk)
{
    INVENTORY inventory;
    inventory.disks = {disk};
    return inventory;
}

TEST(Print, ADiskWithoutAName)
{
    EXPECT_EQ(Part(Printed(WithDisk(DataDisk("sda")), ALL_ANEW), "The disks"),
              "  /dev/sda  9.5 GiB  no model  no serial  holds layout 8, 1: nothing known, "
              "2: nothing known, 3: nothing known  -> WIPED\n");
}

TEST(Print, ADiskWithAName)
{
    DISK disk = BlankDisk("sda");
    disk.szModel = "SPINNER 9";
    disk.szSerial = "A1";
    EXPECT_EQ(Part(Printed(WithDisk(disk), {}), "The disks"),
              "  /dev/sda  9.5 GiB  SPINNER 9  A1  holds blank  -> left alone\n");
}

TEST(Print, BarsOnATerminal)
{
    EXPECT_EQ(Part(ShownOnTerminal(WithDisk(DataDisk("sda")), ALL_ANEW), "The disks"),
              "  /dev/sda  9.5 GiB  no model  no serial  holds layout 8, 1: nothing known, "
              "2: nothing known, 3: nothing known  -> WIPED\n"
              "    now   |111111111111112222222222222 333                             |\n"
              "    then  |111111111111112222222222222                                 |\n");
}

TEST(Print, WhatIsMountedIsMarkedAsLost)
{
    INVENTORY inventory;
    inventory.groups = {FilmsGroup({"/dev/md2"}, {"/films", "/srv/films"})};
    EXPECT_EQ(Part(Printed(inventory, {"/sbin/lvremove -f /dev/vg1/films",
                                       "/sbin/vgremove -f /dev/vg1", "/sbin/pvremove -f /dev/md2"}),
                   "What is lost"),
              "  group vg1 on /dev/md2, volumes: films\n"
              "  ext4 \"cinema\" on /dev/vg1/films, 1.0 GiB (MOUNTED at /films, /srv/films)\n");
}

TEST(Print, AnEmptyPartIsSaidToBeEmpty)
{
    const std::string szPrinted = Printed({}, {});
    EXPECT_EQ(Part(szPrinted, "What is lost"), "  nothing\n");
    EXPECT_EQ(Part(szPrinted, "What should make you stop"), "  nothing\n");
    EXPECT_EQ(Part(szPrinted, "The commands"), "  none\n");
}

} // namespace
