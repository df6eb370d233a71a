// SPDX-License-Identifier: MIT
#include "hwcontrol/disk_port.h"

#include "last_error.h"
#include "nurocore/conf.h"
#include "nurocore/error.h"
#include "nurocore/types.h"
#include "sandbox.h"

#include <array>
#include <cerrno>
#include <cstring>
#include <fstream>
#include <gtest/gtest.h>
#include <string>
#include <unistd.h>
#include <vector>

namespace
{

constexpr char USB_MISSING[] =
    "<11>disk_port.cpp:# Get usbportcfg key from /etc.defaults/nuroinfo.conf Error\n";
constexpr char TOO_LONG[] = "<11>disk_name.cpp:# buffer size of szDiskPath should be longer than "
                            "string length of szPartPath\n";

std::string NoMatch(const std::string &name)
{
    return "<15>disk_port.cpp:# expected sdx or /dev/sdx, not " + name +
           ", not match any port type\n";
}

std::string Letters(size_t n)
{
    std::string name = "sd";
    name.append(n - name.size(), 'x');
    return name;
}

// The disks that the expansion unit behind a SCSI host reports.
void UnitAdd(MACHINE &machine, const std::string &host, const std::string &devices)
{
    MachineFile(machine, "/sys/class/scsi_host/" + host + "/nuro_pm_info",
                "nuro_device_list=" + devices + "\n");
}

// On the machine, while it runs.
void ConfRewrite(const std::string &conf)
{
    std::ofstream(NUROINFO_CONF_PATH) << conf;
}

// The number that the next descriptor to be opened gets.
int DescriptorNext()
{
    const int fd = dup(STDERR_FILENO);
    (void)close(fd);
    return fd;
}

struct NAMED_TYPE {
    const char *szPath;
    int type;
};

struct PORT_CASE {
    const char *szTitle;
    std::string conf;
    std::vector<NAMED_TYPE> disks;
};

// No machine of this table has an expansion unit.
const PORT_CASE PORT_CASES[] = {
    {"internal and USB",
     "internalportcfg=0xf\nusbportcfg=0x30\n",
     {{"sda", INTERNAL_DEVICE},
      {"sdb", INTERNAL_DEVICE},
      {"sdc", INTERNAL_DEVICE},
      {"sdd", INTERNAL_DEVICE},
      {"sde", USB_DEVICE},
      {"sdf", USB_DEVICE},
      {"sdg", OTHER_DEVICE},
      {"sdz", OTHER_DEVICE},
      {"sdaa", OTHER_DEVICE}}},
    {"with and without /dev, whole disks and partitions",
     "internalportcfg=0x1\nusbportcfg=0x2\n",
     {{"/dev/sda", INTERNAL_DEVICE},
      {"/dev/sda3", INTERNAL_DEVICE},
      {"sda12", INTERNAL_DEVICE},
      {"sda0", INTERNAL_DEVICE},
      {"/dev/sdb1", USB_DEVICE},
      {"x/dev/sda", INTERNAL_DEVICE},
      {"/devices/sda", INTERNAL_DEVICE},
      {"sda1p1", INTERNAL_DEVICE}}},
    {"names of other kinds",
     "internalportcfg=0xf\nusbportcfg=0x30\n",
     {{"isda", ISD_DEVICE},
      {"/dev/isdb2", ISD_DEVICE},
      {"isd", ISD_DEVICE},
      {"nuroboot", BOOT_DEVICE},
      {"/dev/nuroboot1", BOOT_DEVICE},
      {"nurobootx", BOOT_DEVICE},
      {"mmcblk0", MMC_DEVICE},
      {"/dev/mmcblk0p1", MMC_DEVICE},
      {"sdammcblk", MMC_DEVICE}}},
    {"a name without letters has no bit",
     "internalportcfg=0xffffffffffffffff\nusbportcfg=0xffffffffffffffff\n"
     "esataportcfg=0xffffffffffffffff\ncacheportcfg=0xffffffffffffffff\n",
     {{"sd", OTHER_DEVICE},
      {"sd1", OTHER_DEVICE},
      {"/dev/sd", OTHER_DEVICE},
      {"sdA", OTHER_DEVICE},
      // 119153338869 modulo 2^32 is negative
      {"sdnuroboot", OTHER_DEVICE}}},
    {"the order of the tests",
     "internalportcfg=0x1\nusbportcfg=0x3\ncacheportcfg=0x7\n",
     {{"sda", INTERNAL_DEVICE}, {"sdb", USB_DEVICE}, {"sdc", CACHE_DEVICE}, {"sdd", OTHER_DEVICE}}},
    {"eSATA comes first",
     "esataportcfg=0x1\ninternalportcfg=0x1\nusbportcfg=0x1\ncacheportcfg=0x1\n",
     {{"sda", ESATA_DEVICE}, {"sdb", OTHER_DEVICE}}},
    {"cache with its first and last bit",
     "usbportcfg=0x10\ncacheportcfg=0x80000001\n",
     {{"sda", CACHE_DEVICE},
      {"sdb", OTHER_DEVICE},
      {"sde", USB_DEVICE},
      {"sdaf", CACHE_DEVICE},
      {"sdag", OTHER_DEVICE}}},
    {"bits 0, 25, 26 and 30 of the internal mask",
     "usbportcfg=0x2\ninternalportcfg=0x46000001\n",
     {{"sda", INTERNAL_DEVICE},
      {"sdy", OTHER_DEVICE},
      {"sdz", INTERNAL_DEVICE},
      {"sdaa", INTERNAL_DEVICE},
      {"sdab", OTHER_DEVICE},
      {"sdae", INTERNAL_DEVICE},
      {"sdaf", OTHER_DEVICE},
      {"sdag", OTHER_DEVICE},
      {"sdba", OTHER_DEVICE}}},
    {"the 32nd disk by bit 31",
     "usbportcfg=0x2\ninternalportcfg=0x80000000\n",
     {{"sdaf", INTERNAL_DEVICE}, {"sdae", OTHER_DEVICE}, {"sdag", OTHER_DEVICE}}},
    {"the 32nd disk by bit 32",
     "usbportcfg=0x2\ninternalportcfg=0x100000000\n",
     {{"sdaf", INTERNAL_DEVICE}, {"sda", OTHER_DEVICE}, {"sdag", OTHER_DEVICE}}},
    {"the 32nd disk by bit 63",
     "usbportcfg=0x2\ninternalportcfg=8000000000000000\n",
     {{"sdaf", INTERNAL_DEVICE}, {"sdag", OTHER_DEVICE}, {"sdbl", OTHER_DEVICE}}},
    {"the 32nd disk by a high bit of the USB mask",
     "usbportcfg=0x4000000000000000\n",
     {{"sdaf", USB_DEVICE}, {"sdae", OTHER_DEVICE}, {"sdag", OTHER_DEVICE}}},
    {"the 32nd disk by a high bit of the cache mask",
     "usbportcfg=1\ncacheportcfg=0x10000000000\n",
     {{"sdaf", CACHE_DEVICE}, {"sdao", OTHER_DEVICE}, {"sdag", OTHER_DEVICE}}},
    {"disks beyond the 32nd match no mask",
     "internalportcfg=0xffffffffffffffff\nusbportcfg=0xffffffffffffffff\n"
     "cacheportcfg=0xffffffffffffffff\n",
     {{"sdaf", INTERNAL_DEVICE},
      {"sdag", OTHER_DEVICE},
      {"sdbl", OTHER_DEVICE},
      {"sdbm", OTHER_DEVICE},
      {"sdzz", OTHER_DEVICE},
      {"sdaaa", OTHER_DEVICE}}},
    // One letter: its own bit. Two: the bit of the first letter, a for bit 0.
    {"eSATA bit 0",
     "usbportcfg=0x40000000\nesataportcfg=0x1\n",
     {{"sda", ESATA_DEVICE},
      {"sdaa", ESATA_DEVICE},
      {"sdaf", ESATA_DEVICE},
      {"sdaz", ESATA_DEVICE},
      {"sdb", OTHER_DEVICE},
      {"sdba", OTHER_DEVICE},
      {"sdae", ESATA_DEVICE}}},
    {"eSATA bit 1",
     "usbportcfg=0x40000000\nesataportcfg=0x2\n",
     {{"sda", OTHER_DEVICE},
      {"sdaz", OTHER_DEVICE},
      {"sdb", ESATA_DEVICE},
      {"sdba", ESATA_DEVICE},
      {"sdbz", ESATA_DEVICE},
      {"sdca", OTHER_DEVICE},
      {"sdae", USB_DEVICE}}},
    {"eSATA bit 25",
     "usbportcfg=0x40000000\nesataportcfg=0x2000000\n",
     {{"sdz", ESATA_DEVICE},
      {"sdza", ESATA_DEVICE},
      {"sdzz", ESATA_DEVICE},
      {"sdyz", OTHER_DEVICE},
      {"sdaaa", OTHER_DEVICE}}},
    // 26 is sdaa's index, whose bit is 0; the bit itself is that of sdaaa (702 / 26 - 1 = 26).
    {"eSATA bit 26",
     "usbportcfg=0x40000000\nesataportcfg=0x4000000\n",
     {{"sdaa", OTHER_DEVICE},
      {"sdz", OTHER_DEVICE},
      {"sdaaa", ESATA_DEVICE},
      {"sdaaz", ESATA_DEVICE},
      {"sdaba", OTHER_DEVICE}}},
    // sdafa is index 832, 832 / 26 - 1 = 31; sdaga 858, whose shift of 32 has no bit.
    {"eSATA bit 31 is not widened",
     "usbportcfg=0x40000000\nesataportcfg=0x80000000\n",
     {{"sdafa", ESATA_DEVICE},
      {"sdaf", OTHER_DEVICE},
      {"sdaga", OTHER_DEVICE},
      {"sdzzz", OTHER_DEVICE}}},
    {"only the low half of the eSATA mask counts",
     "usbportcfg=0x40000000\nesataportcfg=0xffffffff00000000\n",
     {{"sda", OTHER_DEVICE},
      {"sdaf", OTHER_DEVICE},
      {"sdafa", OTHER_DEVICE},
      {"sdaga", OTHER_DEVICE},
      {"sdae", USB_DEVICE}}},
    {"an eSATA mask of 0",
     "usbportcfg=0x2\nesataportcfg=0\ninternalportcfg=1\n",
     {{"sda", INTERNAL_DEVICE}, {"sdaa", OTHER_DEVICE}}},
    {"hexadecimal without 0x, in capitals, in quotes, with blanks",
     "usbportcfg=10\ninternalportcfg = \"0XF\"\ncacheportcfg=\t20 disks\r\n",
     {{"sda", INTERNAL_DEVICE},
      {"sdd", INTERNAL_DEVICE},
      {"sde", USB_DEVICE},
      {"sdf", CACHE_DEVICE},
      {"sdk", OTHER_DEVICE}}},
    {"values that are no numbers are 0",
     "usbportcfg=none\ninternalportcfg=xyz\ncacheportcfg=0xg\n",
     {{"sda", OTHER_DEVICE}}},
    {"an empty USB value is one",
     "usbportcfg= \ninternalportcfg=1\n",
     {{"sda", INTERNAL_DEVICE}, {"sdb", OTHER_DEVICE}}},
    {"64 digits are read, and saturate",
     "usbportcfg=" + std::string(63, '0') + "1\ninternalportcfg=" + std::string(64, 'f') + "\n",
     {{"sda", INTERNAL_DEVICE}, {"sdaf", INTERNAL_DEVICE}, {"sdag", OTHER_DEVICE}}},
    {"65 digits are no value",
     "usbportcfg=1\ninternalportcfg=" + std::string(64, '0') + "f\n",
     {{"sda", USB_DEVICE}, {"sdb", OTHER_DEVICE}}},
    {"the first of two lines decides",
     "usbportcfg=1\nusbportcfg=2\n#internalportcfg=2\ninternalportcfg=4\n",
     {{"sda", USB_DEVICE}, {"sdb", OTHER_DEVICE}, {"sdc", INTERNAL_DEVICE}}},
};

TEST(ExternalDiskPortCheck, ClassifiesByTheMasksOfTheModel)
{
    for (const PORT_CASE &row : PORT_CASES) {
        SCOPED_TRACE(row.szTitle);
        QuietCall(MachineWithConf(row.conf), [&row] {
            RecordReset();
            for (const NAMED_TYPE &disk : row.disks) {
                EXPECT_EQ(ExternalDiskPortCheck(disk.szPath), disk.type) << disk.szPath;
            }
        });
    }
}

TEST(ExternalDiskPortCheck, RefusesNull)
{
    const RUN_RESULT result = MachineCall(MachineWithConf("usbportcfg=1\n"), [] {
        EXPECT_EQ(ExternalDiskPortCheck(nullptr), UNKNOWN_DEVICE);
    });
    EXPECT_EQ(LogText(result), "<11>disk_port.cpp:# device path should not be NULL\n");
}

TEST(ExternalDiskPortCheck, KnowsNoOtherNames)
{
    const struct {
        const char *szPath;
        std::string szNamed; // in the line of the log
    } rows[] = {{"hda", "hda"},
                {"/dev/hda1", "hda"},
                {"md0", "md"},
                {"/dev/md2", "md"},
                {"", ""},
                {"/dev/", ""},
                {"3", ""},
                {"xsda", "xsda"},
                {"SDA", "SDA"},
                {"/dev/SDA", "SDA"},
                {"/dev", "/dev"}, // no further slash to look behind
                {"xnuroboot", "xnuroboot"},
                {"/dev/disk/sda", "disk/sda"}};
    for (const auto &row : rows) {
        const RUN_RESULT result =
            MachineCall(MachineWithConf("usbportcfg=1\ninternalportcfg=1\n"), [&row] {
                EXPECT_EQ(ExternalDiskPortCheck(row.szPath), UNKNOWN_DEVICE) << row.szPath;
            });
        EXPECT_EQ(LogText(result), NoMatch(row.szNamed));
    }
}

TEST(ExternalDiskPortCheck, TakesPathsOfUpTo31Characters)
{
    const MACHINE machine = MachineWithConf("usbportcfg=1\n");
    QuietCall(machine, [] {
        EXPECT_EQ(ExternalDiskPortCheck(Letters(31).c_str()), OTHER_DEVICE);
        EXPECT_EQ(ExternalDiskPortCheck(("/dev/" + Letters(26)).c_str()), OTHER_DEVICE);
        EXPECT_EQ(ExternalDiskPortCheck((Letters(30) + "1").c_str()), OTHER_DEVICE);
        EXPECT_EQ(ExternalDiskPortCheck((Letters(40) + "mmcblk").c_str()), MMC_DEVICE);
    });
    for (const std::string &path : {Letters(32), Letters(33), Letters(31) + "1",
                                    "/dev/" + Letters(27), "nuroboot" + std::string(24, 'x')}) {
        SCOPED_TRACE(path);
        const RUN_RESULT result = MachineCall(
            machine, [&path] { EXPECT_EQ(ExternalDiskPortCheck(path.c_str()), UNKNOWN_DEVICE); });
        EXPECT_EQ(LogText(result), TOO_LONG);
    }
}

TEST(ExternalDiskPortCheck, ClassifiesNothingWithoutTheUsbMask)
{
    const std::string others = "esataportcfg=1\ninternalportcfg=0xf\ncacheportcfg=0xff\n";
    for (const std::string &usb :
         {std::string(), std::string("usbportcfg=\n"), std::string("usbportcfg\n"),
          std::string("#usbportcfg=1\n"), "usbportcfg=" + std::string(65, '1') + "\n"}) {
        SCOPED_TRACE(usb);
        const RUN_RESULT result = MachineCall(MachineWithConf(usb + others), [] {
            EXPECT_EQ(ExternalDiskPortCheck("sda"), UNKNOWN_DEVICE);
            EXPECT_EQ(ExternalDiskPortCheck("/dev/sdb1"), UNKNOWN_DEVICE);
            EXPECT_EQ(ExternalDiskPortCheck("isda"), UNKNOWN_DEVICE);
            EXPECT_EQ(ExternalDiskPortCheck("hda"), UNKNOWN_DEVICE);
            // These two are told by their names alone.
            EXPECT_EQ(ExternalDiskPortCheck("nuroboot"), BOOT_DEVICE);
            EXPECT_EQ(ExternalDiskPortCheck("mmcblk0"), MMC_DEVICE);
        });
        EXPECT_EQ(LogText(result),
                  std::string(USB_MISSING) + USB_MISSING + USB_MISSING + USB_MISSING);
    }
}

TEST(ExternalDiskPortCheck, ClassifiesNothingWithoutTheFile)
{
    MACHINE machine = MachineMake();
    MachineRemove(machine, "/etc.defaults");
    const RUN_RESULT result =
        MachineCall(machine, [] { EXPECT_EQ(ExternalDiskPortCheck("sda"), UNKNOWN_DEVICE); });
    EXPECT_EQ(LogText(result), USB_MISSING);
}

TEST(ExternalDiskPortCheckName, TakesBareNamesAsTheyAre)
{
    const MACHINE machine = MachineWithConf("usbportcfg=2\ninternalportcfg=1\n");
    const RUN_RESULT result = MachineCall(machine, [] {
        EXPECT_EQ(ExternalDiskPortCheckName("sda"), INTERNAL_DEVICE);
        EXPECT_EQ(ExternalDiskPortCheckName("sda1"), INTERNAL_DEVICE);
        EXPECT_EQ(ExternalDiskPortCheckName("sdb"), USB_DEVICE);
        EXPECT_EQ(ExternalDiskPortCheckName("isda"), ISD_DEVICE);
        EXPECT_EQ(ExternalDiskPortCheckName("nuroboot"), UNKNOWN_DEVICE);
        EXPECT_EQ(ExternalDiskPortCheckName("mmcblk0"), UNKNOWN_DEVICE);
        EXPECT_EQ(ExternalDiskPortCheckName("/dev/sda"), UNKNOWN_DEVICE);
        EXPECT_EQ(ExternalDiskPortCheckName(nullptr), UNKNOWN_DEVICE);
        EXPECT_EQ(NLIBCErrGet(), ERR_BAD_PARAMETER);
    });
    EXPECT_EQ(LogText(result), NoMatch("nuroboot") + NoMatch("mmcblk0") + NoMatch("/dev/sda"));
}

TEST(PortMasks, AreReadOnceWhenThereIsAUsbMask)
{
    QuietCall(MachineWithConf("usbportcfg=2\ninternalportcfg=1\n"), [] {
        EXPECT_EQ(ExternalDiskPortCheck("sda"), INTERNAL_DEVICE);
        ConfRewrite("usbportcfg=1\ninternalportcfg=2\n");
        EXPECT_EQ(ExternalDiskPortCheck("sda"), INTERNAL_DEVICE);
        EXPECT_EQ(unlink(NUROINFO_CONF_PATH), 0);
        EXPECT_EQ(ExternalDiskPortCheck("sdb"), USB_DEVICE);
    });
}

TEST(PortMasks, AreReadOnEveryCallWhileTheUsbMaskIsZero)
{
    const RUN_RESULT result = MachineCall(MachineWithConf("usbportcfg=0\ninternalportcfg=1\n"), [] {
        EXPECT_EQ(ExternalDiskPortCheck("sda"), INTERNAL_DEVICE);
        ConfRewrite("usbportcfg=0x0\ninternalportcfg=2\n");
        EXPECT_EQ(ExternalDiskPortCheck("sda"), OTHER_DEVICE);
        EXPECT_EQ(ExternalDiskPortCheck("sdb"), INTERNAL_DEVICE);
        ConfRewrite("internalportcfg=1\n");
        EXPECT_EQ(ExternalDiskPortCheck("sdb"), UNKNOWN_DEVICE);
        EXPECT_EQ(unlink(NUROINFO_CONF_PATH), 0);
        EXPECT_EQ(ExternalDiskPortCheck("sdb"), UNKNOWN_DEVICE);
        ConfRewrite("usbportcfg=4\ninternalportcfg=8\n");
        EXPECT_EQ(ExternalDiskPortCheck("sdc"), USB_DEVICE);
        EXPECT_EQ(ExternalDiskPortCheck("sdd"), INTERNAL_DEVICE);
    });
    EXPECT_EQ(LogText(result), std::string(USB_MISSING) + USB_MISSING);
}

TEST(PortMasks, KeepWhatAMissingKeyDoesNotReplace)
{
    QuietCall(MachineWithConf("usbportcfg=0\nesataportcfg=1\ninternalportcfg=2\ncacheportcfg=4\n"),
              [] {
                  EXPECT_EQ(ExternalDiskPortCheck("sda"), ESATA_DEVICE);
                  ConfRewrite("usbportcfg=8\n");
                  EXPECT_EQ(ExternalDiskPortCheck("sda"), ESATA_DEVICE);
                  EXPECT_EQ(ExternalDiskPortCheck("sdb"), INTERNAL_DEVICE);
                  EXPECT_EQ(ExternalDiskPortCheck("sdc"), CACHE_DEVICE);
                  EXPECT_EQ(ExternalDiskPortCheck("sdd"), USB_DEVICE);
              });
}

// ---- expansion units ---------------------------------------------------------------------------

TEST(ExpansionUnit, ReportsTheDisksBehindAnEsataPort)
{
    MACHINE machine = MachineWithConf("usbportcfg=1\ninternalportcfg=0xfe\nesataportcfg=0x40\n");
    UnitAdd(machine, "host3", "/dev/sdga,/dev/sdgb");
    QuietCall(machine, [] {
        EXPECT_EQ(ExternalDiskPortCheck("sdga"), EUNIT_DEVICE);
        EXPECT_EQ(ExternalDiskPortCheck("/dev/sdgb3"), EUNIT_DEVICE);
        EXPECT_EQ(ExternalDiskPortCheck("sdgc"), ESATA_DEVICE);
        EXPECT_EQ(ExternalDiskPortCheck("sdg"), EUNIT_DEVICE); // loose: sdg is in sdga
        EXPECT_EQ(ExternalDiskPortCheck("sdf"), INTERNAL_DEVICE);
        EXPECT_EQ(ExternalDiskPortCheck("sdfa"), OTHER_DEVICE);
    });
}

TEST(ExpansionUnit, DoesNotCountForDisksOfOtherPorts)
{
    MACHINE machine = MachineWithConf("usbportcfg=1\ninternalportcfg=0x40\n");
    UnitAdd(machine, "host0", "/dev/sdg,/dev/sda");
    QuietCall(machine, [] {
        EXPECT_EQ(ExternalDiskPortCheck("sdg"), INTERNAL_DEVICE);
        EXPECT_EQ(ExternalDiskPortCheck("sda"), USB_DEVICE);
    });
}

struct UNIT_CASE {
    const char *szTitle;
    std::vector<std::pair<std::string, std::string>> hosts; // directory, list
    int result;
    std::string szOut;
};

const UNIT_CASE UNIT_CASES[] = {
    {"no host", {}, -1, ""},
    {"one disk", {{"host0", "/dev/sdga"}}, 0, "sdga "},
    {"two disks", {{"host0", "/dev/sdga,/dev/sdgb"}}, 0, "sdga sdgb "},
    {"hosts in alphabetical order",
     {{"host10", "/dev/sdc"}, {"host2", "/dev/sdd"}, {"host0", "/dev/sda"}, {"host1", "/dev/sdb"}},
     0,
     "sda sdb sdc sdd "},
    {"only hosts count",
     {{"ghost0", "/dev/sda"}, {"hos", "/dev/sdb"}, {"Host1", "/dev/sdc"}, {"host", "/dev/sdd"}},
     0,
     "sdd "},
    {"quotes and blanks around the list",
     {{"host0", " \"/dev/sdga,/dev/sdgb\" "}},
     0,
     "sdga sdgb "},
    {"capital letters", {{"host0", "/dev/sdA,/dev/SDB"}}, 0, "sdA SDB "},
    {"a comma at the end", {{"host0", "/dev/sdga,"}}, 0, "sdga "},
    {"a blank behind the comma", {{"host0", "/dev/sdga, /dev/sdgb"}}, 0, "sdga "},
    {"another separator", {{"host0", "/dev/sdga;/dev/sdgb"}}, 0, "sdga "},
    {"two commas", {{"host0", "/dev/sdga,,/dev/sdgb"}}, 0, "sdga "},
    {"a digit ends the list", {{"host0", "/dev/sdga1,/dev/sdgb"}}, 0, "sdga "},
    {"a list that ends goes on with the next host",
     {{"host0", "/dev/sdga1,/dev/sdgb"}, {"host1", "/dev/sdha"}},
     0,
     "sdga sdha "},
    {"a name without its path", {{"host0", "sdga,/dev/sdgb"}}, -1, ""},
    {"a path without a name", {{"host0", "/dev/,/dev/sdgb"}}, -1, ""},
    {"a path that starts with a digit", {{"host0", "/dev/1,/dev/sdgb"}}, -1, ""},
    {"another folder", {{"host0", "/DEV/sdga"}}, -1, ""},
    {"an empty list", {{"host0", ""}, {"host1", " "}, {"host2", "/dev/sda"}}, 0, "sda "},
    {"the same disk twice", {{"host0", "/dev/sda"}, {"host1", "/dev/sda"}}, 0, "sda sda "},
    {"15 letters", {{"host0", "/dev/abcdefghijklmno,/dev/sdb"}}, 0, "abcdefghijklmno sdb "},
    {"16 letters end the list",
     {{"host0", "/dev/abcdefghijklmnop,/dev/sdb"}},
     0,
     "abcdefghijklmno "},
    // 255 characters are read, 256 are not.
    {"a list of 255 characters",
     {{"host0", "/dev/sda," + std::string(246, ',')}, {"host1", "/dev/sdb"}},
     0,
     "sda sdb "},
    {"a list of 256 characters",
     {{"host0", "/dev/sda," + std::string(247, ',')}, {"host1", "/dev/sdb"}},
     0,
     "sdb "},
};

TEST(ExternalDiskPortEnumEunit, ListsTheDisksOfAllHosts)
{
    for (const UNIT_CASE &row : UNIT_CASES) {
        SCOPED_TRACE(row.szTitle);
        MACHINE machine = MachineMake();
        MachineFolder(machine, "/sys/class/scsi_host");
        for (const auto &[host, devices] : row.hosts) {
            UnitAdd(machine, host, devices);
        }
        QuietCall(machine, [&row] {
            std::array<char, 1024> out = {};
            out.fill('~');
            EXPECT_EQ(ExternalDiskPortEnumEunit(0, out.data(), 1024), row.result);
            EXPECT_STREQ(out.data(), row.szOut.c_str());
            for (size_t i = row.szOut.size(); i < out.size(); i++) {
                ASSERT_EQ(out.at(i), '\0') << i; // cleared as a whole
            }
        });
    }
}

TEST(ExternalDiskPortEnumEunit, PassesHostsThatReportNothing)
{
    MACHINE machine = MachineMake();
    MachineFolder(machine, "/sys/class/scsi_host/host0");
    MachineFile(machine, "/sys/class/scsi_host/host1", "nuro_device_list=/dev/sda\n");
    MachineFile(machine, "/sys/class/scsi_host/host2/nuro_pm_info", "vendor=x\n");
    MachineFile(machine, "/sys/class/scsi_host/host3/nuro_pm_info",
                "vendor=x\nnuro_device_list=\"/dev/sdga\"\nnuro_device_list=/dev/sdgb\n");
    QuietCall(machine, [] {
        char szOut[64];
        EXPECT_EQ(ExternalDiskPortEnumEunit(0, szOut, sizeof(szOut)), 0);
        EXPECT_STREQ(szOut, "sdga ");
    });
}

// As where there are none; nothing is said about it.
TEST(ExternalDiskPortEnumEunit, FailsWhereHostsCannotBeListed)
{
    MACHINE missing = MachineMake();
    MachineRemove(missing, "/sys/class");
    MACHINE refused = MachineMake();
    refused.faults = {{.szFunction = "scandir", .error = EACCES}};
    for (const MACHINE &machine : {missing, refused}) {
        QuietCall(machine, [] {
            char szOut[64] = "old";
            EXPECT_EQ(ExternalDiskPortEnumEunit(0, szOut, sizeof(szOut)), -1);
            EXPECT_STREQ(szOut, "");
        });
    }
}

TEST(ExternalDiskPortEnumEunit, RefusesNull)
{
    MACHINE machine = MachineMake();
    UnitAdd(machine, "host0", "/dev/sdga");
    QuietCall(machine, [] {
        char szOut[8] = "x";
        EXPECT_FAILS(ExternalDiskPortEnumEunit(0, nullptr, 1024), -1, ERR_BAD_PARAMETER);
        EXPECT_FAILS(ExternalDiskPortEnumEunit(0, szOut, 0), -1, ERR_BAD_PARAMETER);
        EXPECT_STREQ(szOut, "x");
    });
}

TEST(ExternalDiskPortEnumEunit, ListsOnlyWhatOpensWhenAsked)
{
    MACHINE machine = MachineMake();
    UnitAdd(machine, "host0", "/dev/sdga,/dev/sdgb,/dev/sdgc,/dev/abcdefghijklmno");
    MachineFile(machine, "/dev/sdgb", "disk");
    MachineFile(machine, "/dev/abcdefghijklmno", "disk");
    MachineFolder(machine, "/dev/sdgc"); // opens for reading, not for writing
    QuietCall(machine, [] {
        char szOut[64];
        const int fdBefore = DescriptorNext();
        EXPECT_EQ(ExternalDiskPortEnumEunit(1, szOut, sizeof(szOut)), 0);
        EXPECT_STREQ(szOut, "sdgb abcdefghijklmno ");
        EXPECT_EQ(ExternalDiskPortEnumEunit(-1, szOut, sizeof(szOut)), 0);
        EXPECT_STREQ(szOut, "sdgb abcdefghijklmno ");
        EXPECT_EQ(ExternalDiskPortEnumEunit(0, szOut, sizeof(szOut)), 0);
        EXPECT_STREQ(szOut, "sdga sdgb sdgc abcdefghijklmno ");
        EXPECT_EQ(DescriptorNext(), fdBefore); // all closed again
        EXPECT_EQ(unlink("/dev/sdgb"), 0);
        EXPECT_EQ(unlink("/dev/abcdefghijklmno"), 0);
        EXPECT_EQ(ExternalDiskPortEnumEunit(1, szOut, sizeof(szOut)), -1);
        EXPECT_STREQ(szOut, "");
    });
}

struct SPACE_CASE {
    int cbOut;
    int result;
    const char *szOut;
};

// "sdga" and "sdgb": a name has room when it ends at the buffer's size at the latest; blank and
// last letter are cut then.
constexpr SPACE_CASE SPACE_CASES[] = {
    {1, -1, ""},           {3, -1, ""},           {4, -1, "sdg"}, // 3 + 4 letters for the second
    {5, -1, "sdga"},                                              // 4 + 4
    {6, -1, "sdga "},                                             // 5 + 4
    {8, -1, "sdga "},      {9, 0, "sdga sdg"},    {10, 0, "sdga sdgb"},
    {11, 0, "sdga sdgb "}, {12, 0, "sdga sdgb "},
};

TEST(ExternalDiskPortEnumEunit, FailsWhenTheNamesDoNotFit)
{
    MACHINE machine = MachineMake();
    UnitAdd(machine, "host0", "/dev/sdga");
    UnitAdd(machine, "host1", "/dev/sdgb");
    QuietCall(machine, [] {
        for (const SPACE_CASE &row : SPACE_CASES) {
            SCOPED_TRACE(row.cbOut);
            std::array<char, 32> out = {};
            out.fill('~');
            RecordReset();
            EXPECT_EQ(ExternalDiskPortEnumEunit(0, out.data(), row.cbOut), row.result);
            EXPECT_STREQ(out.data(), row.szOut);
            EXPECT_EQ(out.at(static_cast<size_t>(row.cbOut)), '~');
            if (row.result != 0) {
                EXPECT_EQ(NLIBCErrGet(), ERR_BAD_FORMAT);
                EXPECT_STREQ(NLIBCErrGetFile(), "disk_port.cpp");
            }
        }
    });
}

// 12 names of 15 letters take 192 bytes; those of a sixth host do not fit in 1024.
TEST(ExpansionUnit, IsNoneWhenItsListIsTooLongForTheCheck)
{
    std::string devices;
    for (int i = 0; i < 12; i++) {
        devices += (i == 0 ? "/dev/" : ",/dev/") + std::string(15, static_cast<char>('a' + i));
    }
    ASSERT_LT(devices.size(), 256U);
    MACHINE machine = MachineWithConf("usbportcfg=1\nesataportcfg=2\n");
    UnitAdd(machine, "host0", "/dev/sdb");
    for (const char *szHost : {"host1", "host2", "host3", "host4", "host5"}) {
        UnitAdd(machine, szHost, devices);
    }
    const auto check = [](DISK_PORT_TYPE type) {
        return [type] { EXPECT_EQ(ExternalDiskPortCheck("sdb"), type); };
    };
    EXPECT_EQ(LogText(MachineCall(machine, check(EUNIT_DEVICE))), "");
    UnitAdd(machine, "host6", devices);
    EXPECT_EQ(LogText(MachineCall(machine, check(ESATA_DEVICE))), "");
}

// Fills the units' list with `cbOther` bytes of other disks and reports sdb behind them.
MACHINE MachineWithLongList(size_t cbOther)
{
    MACHINE machine = MachineWithConf("usbportcfg=1\nesataportcfg=2\n");
    int nHost = 10; // two digits sort as they count
    while (cbOther > 0) {
        std::string devices;
        for (int i = 0; i < 12 && cbOther > 0; i++) {
            const size_t cbName = cbOther > 32 ? 15 : (cbOther > 16 ? cbOther / 2 : cbOther) - 1;
            devices += (i == 0 ? "/dev/" : ",/dev/") + std::string(cbName, 'x');
            cbOther -= cbName + 1;
        }
        UnitAdd(machine, "host" + std::to_string(nHost++), devices);
    }
    UnitAdd(machine, "host" + std::to_string(nHost), "/dev/sdb");
    return machine;
}

// "sdb" has room when it ends at the 1024th byte at the latest, but loses its last letter there to
// the end of the text.
TEST(ExpansionUnit, HasAListOf1024Bytes)
{
    const struct {
        size_t cbOther;
        int type;
    } rows[] = {{1019, EUNIT_DEVICE},
                {1020, EUNIT_DEVICE},
                {1021, ESATA_DEVICE},
                {1022, ESATA_DEVICE},
                {1023, ESATA_DEVICE}};
    for (const auto &row : rows) {
        SCOPED_TRACE(row.cbOther);
        QuietCall(MachineWithLongList(row.cbOther), [&row] {
            std::array<char, 1024> list = {};
            (void)ExternalDiskPortEnumEunit(0, list.data(), 1024);
            EXPECT_EQ(strspn(list.data(), "x "), row.cbOther);
            EXPECT_EQ(ExternalDiskPortCheck("sdb"), row.type);
        });
    }
}

// ---- enumeration -------------------------------------------------------------------------------

std::string ItemsOf(PNLIBSZLIST pList)
{
    std::string items;
    for (int i = 0; i < pList->nItem; i++) {
        items += std::string(NLIBCSzListGet(pList, i)) + " ";
    }
    return items;
}

constexpr char ENUM_CONF[] =
    "usbportcfg=0x30\nesataportcfg=0x40\ninternalportcfg=0xf\ncacheportcfg=0x80\n";

MACHINE MachineWithDisks()
{
    MACHINE machine = MachineWithConf(ENUM_CONF);
    for (const char *szDisk :
         {"sdh", "sdgb", "sdga", "sdg",  "sdf",      "sde", "sdd", "sdc",     "sdb", "sdaf",
          "sda", "sdi",  "isdb", "isda", "nuroboot", "md0", "sr0", "mmcblk0", "hda", "sd"}) {
        MachineFolder(machine, std::string("/sys/block/") + szDisk);
    }
    UnitAdd(machine, "host0", "/dev/sdga,/dev/sdgc");
    return machine;
}

struct ENUM_CASE {
    DISK_PORT_TYPE type;
    const char *szItems;
};

constexpr ENUM_CASE ENUM_CASES[] = {
    {INTERNAL_DEVICE, "sda sdb sdc sdd "},
    {ESATA_DEVICE, "sdgb "},
    {EUNIT_DEVICE, "sdg sdga "},
    {USB_DEVICE, "sde sdf "},
    {BOOT_DEVICE, "nuroboot "},
    {ISD_DEVICE, "isda isdb "},
    {CACHE_DEVICE, "sdh "},
};

TEST(ExternalDiskPortEnum, ListsTheDisksOfAType)
{
    const MACHINE machine = MachineWithDisks();
    for (const ENUM_CASE &row : ENUM_CASES) {
        SCOPED_TRACE(row.type);
        QuietCall(machine, [&row] {
            PNLIBSZLIST pList = NLIBCSzListAlloc(1024);
            EXPECT_EQ(ExternalDiskPortEnum(row.type, &pList), 0);
            EXPECT_EQ(ItemsOf(pList), row.szItems);
            EXPECT_EQ(pList->fMode, SZLIST_SORTED);
            NLIBCSzListFree(pList);
        });
    }
}

TEST(ExternalDiskPortEnum, SortsByBytes)
{
    MACHINE machine = MachineWithConf("usbportcfg=0x80000000\ninternalportcfg=0x7fffffff\n");
    for (const char *szDisk : {"sdb", "sdaa", "sdz", "sda", "sdab", "sdaf"}) {
        MachineFolder(machine, std::string("/sys/block/") + szDisk);
    }
    QuietCall(machine, [] {
        PNLIBSZLIST pList = NLIBCSzListAlloc(1024);
        EXPECT_EQ(ExternalDiskPortEnum(INTERNAL_DEVICE, &pList), 0);
        EXPECT_EQ(ItemsOf(pList), "sda sdaa sdab sdb sdz ");
        NLIBCSzListFree(pList);
    });
}

TEST(ExternalDiskPortEnum, AppendsAndSortsTheWholeList)
{
    QuietCall(MachineWithDisks(), [] {
        PNLIBSZLIST pList = NLIBCSzListAlloc(128);
        (void)NLIBCSzListPush(&pList, "sdbz");
        (void)NLIBCSzListPush(&pList, "aaa");
        EXPECT_EQ(ExternalDiskPortEnum(INTERNAL_DEVICE, &pList), 0);
        EXPECT_EQ(ExternalDiskPortEnum(USB_DEVICE, &pList), 0);
        EXPECT_EQ(ItemsOf(pList), "aaa sda sdb sdbz sdc sdd sde sdf ");
        NLIBCSzListFree(pList);
    });
}

// 120 names of 5 bytes and 4 a slot need more than a list of 512 bytes has.
TEST(ExternalDiskPortEnum, LetsTheListGrow)
{
    MACHINE machine = MachineWithConf("usbportcfg=1\nesataportcfg=0x3ffffff\n");
    std::string expected;
    for (char first = 'b'; first < 'h'; first++) {
        for (char second = 'a'; second < 'u'; second++) {
            const std::string disk = {'s', 'd', first, second};
            MachineFolder(machine, "/sys/block/" + disk);
            expected += disk + " ";
        }
    }
    QuietCall(machine, [&expected] {
        PNLIBSZLIST pList = NLIBCSzListAlloc(512);
        EXPECT_EQ(ExternalDiskPortEnum(ESATA_DEVICE, &pList), 0);
        EXPECT_EQ(ItemsOf(pList), expected);
        EXPECT_EQ(pList->nSize, 2048);
        NLIBCSzListFree(pList);
    });
}

TEST(ExternalDiskPortEnum, SortsWhenDisksAreThereButNoneIsOfTheType)
{
    MACHINE machine = MachineWithConf("usbportcfg=1\n");
    MachineFolder(machine, "/sys/block/sdb");
    QuietCall(machine, [] {
        PNLIBSZLIST pList = NLIBCSzListAlloc(512);
        EXPECT_EQ(ExternalDiskPortEnum(INTERNAL_DEVICE, &pList), 0);
        EXPECT_EQ(pList->nItem, 0);
        EXPECT_EQ(pList->fMode, SZLIST_SORTED);
        NLIBCSzListFree(pList);
    });
}

TEST(ExternalDiskPortEnum, LeavesTheListAloneWhereNoDiskIs)
{
    MACHINE machine = MachineWithConf(ENUM_CONF);
    MachineFolder(machine, "/sys/block/md0");
    MACHINE noFolder = machine;
    MachineRemove(noFolder, "/sys/block");
    const auto enumerate = [] {
        PNLIBSZLIST pList = NLIBCSzListAlloc(512);
        (void)NLIBCSzListPush(&pList, "b");
        (void)NLIBCSzListPush(&pList, "a");
        for (const ENUM_CASE &row : ENUM_CASES) {
            EXPECT_EQ(ExternalDiskPortEnum(row.type, &pList), 0) << row.type;
        }
        EXPECT_EQ(ItemsOf(pList), "b a ");
        EXPECT_EQ(pList->fMode, SZLIST_UNSORTED);
        NLIBCSzListFree(pList);
    };
    EXPECT_EQ(LogText(MachineCall(machine, enumerate)), "");
    EXPECT_EQ(LogText(MachineCall(noFolder, enumerate)), "");
}

TEST(ExternalDiskPortEnum, FindsNothingButLogsEachDiskWithoutTheUsbMask)
{
    MACHINE machine = MachineWithConf("internalportcfg=0xf\n");
    MachineFolder(machine, "/sys/block/sda");
    MachineFolder(machine, "/sys/block/sdb");
    const RUN_RESULT result = MachineCall(machine, [] {
        PNLIBSZLIST pList = NLIBCSzListAlloc(512);
        EXPECT_EQ(ExternalDiskPortEnum(INTERNAL_DEVICE, &pList), 0);
        EXPECT_EQ(pList->nItem, 0);
        NLIBCSzListFree(pList);
    });
    EXPECT_EQ(LogText(result), std::string(USB_MISSING) + USB_MISSING);
}

TEST(ExternalDiskPortEnum, RefusesTypesThatAreNotEnumerated)
{
    for (const int type : {0, 8, 9, 10, 15}) {
        SCOPED_TRACE(type);
        const RUN_RESULT result = MachineCall(MachineWithDisks(), [type] {
            PNLIBSZLIST pList = NLIBCSzListAlloc(512);
            (void)NLIBCSzListPush(&pList, "b");
            EXPECT_EQ(ExternalDiskPortEnum(static_cast<DISK_PORT_TYPE>(type), &pList), -1);
            EXPECT_EQ(ItemsOf(pList), "b ");
            EXPECT_EQ(pList->fMode, SZLIST_UNSORTED);
            NLIBCSzListFree(pList);
        });
        EXPECT_EQ(LogText(result), "<11>disk_port.cpp:# disk port type doesn't exist\n");
    }
}

TEST(ExternalDiskPortEnum, RefusesNull)
{
    const RUN_RESULT result = MachineCall(MachineWithDisks(), [] {
        PNLIBSZLIST pList = nullptr;
        EXPECT_EQ(ExternalDiskPortEnum(INTERNAL_DEVICE, nullptr), -1);
        EXPECT_EQ(ExternalDiskPortEnum(INTERNAL_DEVICE, &pList), -1);
        EXPECT_EQ(ExternalDiskPortEnum(OTHER_DEVICE, nullptr), -1);
    });
    const std::string line = "<11>disk_port.cpp:# device name list can not be NULL\n";
    EXPECT_EQ(LogText(result), line + line + line);
}

struct GLOB_CASE {
    DISK_PORT_TYPE type;
    int error; // ENOMEM: no memory for the matches; every other: a folder cannot be read
    std::string log;
};

const GLOB_CASE GLOB_CASES[] = {
    {INTERNAL_DEVICE, EIO, "<11>disk_port.cpp:# read error :/sys/block/sd*\n"},
    {ISD_DEVICE, EIO, "<11>disk_port.cpp:# read error :/sys/block/isd*\n"},
    {BOOT_DEVICE, EIO, "<11>disk_port.cpp:# read error :/sys/block/nuroboot\n"},
    {CACHE_DEVICE, ENOMEM,
     "<11>disk_port.cpp:# out of memory to alloc glob function when looking for:/sys/block/sd*\n"},
    {BOOT_DEVICE, ENOMEM,
     "<11>disk_port.cpp:# out of memory to alloc glob function when looking "
     "for:/sys/block/nuroboot\n"},
};

TEST(ExternalDiskPortEnum, FailsWhenTheDisksCannotBeListed)
{
    for (const GLOB_CASE &row : GLOB_CASES) {
        SCOPED_TRACE(testing::Message() << row.type << ' ' << row.error);
        MACHINE machine = MachineWithDisks();
        machine.faults = {{.szFunction = "glob", .error = row.error}};
        const RUN_RESULT result = MachineCall(machine, [&row] {
            PNLIBSZLIST pList = NLIBCSzListAlloc(512);
            (void)NLIBCSzListPush(&pList, "b");
            EXPECT_EQ(ExternalDiskPortEnum(row.type, &pList), -1);
            EXPECT_EQ(ItemsOf(pList), "b ");
            EXPECT_EQ(pList->fMode, SZLIST_UNSORTED);
            NLIBCSzListFree(pList);
        });
        EXPECT_EQ(LogText(result), row.log);
    }
}

TEST(IsSupportSas, IsAskedOnceInAProcess)
{
    const auto ask = [](int fSas, const std::string &conf) {
        return [fSas, conf] {
            EXPECT_EQ(IsSupportSas(), fSas);
            ConfRewrite(conf);
            EXPECT_EQ(IsSupportSas(), fSas);
        };
    };
    const std::string yes = "supportsas=\"YES\"\n";
    const std::string no = "supportsas=no\n";
    EXPECT_EQ(LogText(MachineCall(MachineWithConf(yes), ask(1, no))), "");
    EXPECT_EQ(LogText(MachineCall(MachineWithConf(no), ask(0, yes))), "");
    EXPECT_EQ(LogText(MachineCall(MachineWithConf("supportsas=yesno\n"), ask(0, yes))), "");
    EXPECT_EQ(LogText(MachineCall(MachineWithConf(""), ask(0, yes))), "");
}

} // namespace
