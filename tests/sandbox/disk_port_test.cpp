// SPDX-License-Identifier: MIT
#include "hwcontrol/disk_port.h"

#include "nurocore/conf.h"
#include "nurocore/error.h"
#include "nurocore/types.h"
#include "steps.h"

#include <array>
#include <cerrno>
#include <cstring>
#include <fstream>
#include <gtest/gtest.h>
#include <ostream>
#include <sstream>
#include <string>
#include <unistd.h>
#include <vector>

namespace
{

const STEPS USB_MISSING = {
    {"<11>disk_port.cpp:# Get usbportcfg key from /etc.defaults/nuroinfo.conf Error"}};
const STEPS TOO_LONG = {{"<11>disk_name.cpp:# buffer size of szDiskPath should be longer than "
                         "string length of szPartPath"}};

STEPS NoMatch(const std::string &name)
{
    return {{"<15>disk_port.cpp:# expected sdx or /dev/sdx, not " + name +
             ", not match any port type"}};
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

struct TYPED {
    DISK_PORT_TYPE type;
    std::vector<std::string> paths;
};

struct PORT_CASE {
    const char *szTitle;
    std::string conf;
    std::vector<TYPED> disks;
};

// The paths are of these types, and this is logged about them.
void ExpectTypes(const MACHINE &machine, const std::vector<TYPED> &disks, const STEPS &steps = {})
{
    const RUN_RESULT result = MachineCall(machine, [&disks] {
        for (const TYPED &disk : disks) {
            for (const std::string &path : disk.paths) {
                EXPECT_EQ(ExternalDiskPortCheck(path.c_str()), disk.type) << path;
            }
        }
    });
    ExpectSteps(result, steps);
}

// No machine of this table has an expansion unit.
const PORT_CASE PORT_CASES[] = {
    {"internal and USB",
     "internalportcfg=0xf\nusbportcfg=0x30\n",
     {{INTERNAL_DEVICE, {"sda", "sdb", "sdc", "sdd"}},
      {USB_DEVICE, {"sde", "sdf"}},
      {OTHER_DEVICE, {"sdg", "sdz", "sdaa"}}}},
    {"with and without /dev, whole disks and partitions",
     "internalportcfg=0x1\nusbportcfg=0x2\n",
     {{INTERNAL_DEVICE,
       {"/dev/sda", "/dev/sda3", "sda12", "sda0", "x/dev/sda", "/devices/sda", "sda1p1"}},
      {USB_DEVICE, {"/dev/sdb1"}}}},
    {"names of other kinds",
     "internalportcfg=0xf\nusbportcfg=0x30\n",
     {{ISD_DEVICE, {"isda", "/dev/isdb2", "isd"}},
      {BOOT_DEVICE, {"nuroboot", "/dev/nuroboot1", "nurobootx"}},
      {MMC_DEVICE, {"mmcblk0", "/dev/mmcblk0p1", "sdammcblk"}}}},
    // 119153338869, of the last, modulo 2^32 is negative.
    {"a name without letters has no bit",
     "internalportcfg=0xffffffffffffffff\nusbportcfg=0xffffffffffffffff\n"
     "esataportcfg=0xffffffffffffffff\ncacheportcfg=0xffffffffffffffff\n",
     {{OTHER_DEVICE, {"sd", "sd1", "/dev/sd", "sdA", "sdnuroboot"}}}},
    {"the order of the tests",
     "internalportcfg=0x1\nusbportcfg=0x3\ncacheportcfg=0x7\n",
     {{INTERNAL_DEVICE, {"sda"}},
      {USB_DEVICE, {"sdb"}},
      {CACHE_DEVICE, {"sdc"}},
      {OTHER_DEVICE, {"sdd"}}}},
    {"eSATA comes first",
     "esataportcfg=0x1\ninternalportcfg=0x1\nusbportcfg=0x1\ncacheportcfg=0x1\n",
     {{ESATA_DEVICE, {"sda"}}, {OTHER_DEVICE, {"sdb"}}}},
    {"cache with its first and last bit",
     "usbportcfg=0x10\ncacheportcfg=0x80000001\n",
     {{CACHE_DEVICE, {"sda", "sdaf"}}, {OTHER_DEVICE, {"sdb", "sdag"}}, {USB_DEVICE, {"sde"}}}},
    {"bits 0, 25, 26 and 30 of the internal mask",
     "usbportcfg=0x2\ninternalportcfg=0x46000001\n",
     {{INTERNAL_DEVICE, {"sda", "sdz", "sdaa", "sdae"}},
      {OTHER_DEVICE, {"sdy", "sdab", "sdaf", "sdag", "sdba"}}}},
    {"the 32nd disk by bit 31",
     "usbportcfg=0x2\ninternalportcfg=0x80000000\n",
     {{INTERNAL_DEVICE, {"sdaf"}}, {OTHER_DEVICE, {"sdae", "sdag"}}}},
    {"the 32nd disk by bit 32",
     "usbportcfg=0x2\ninternalportcfg=0x100000000\n",
     {{INTERNAL_DEVICE, {"sdaf"}}, {OTHER_DEVICE, {"sda", "sdag"}}}},
    {"the 32nd disk by bit 63",
     "usbportcfg=0x2\ninternalportcfg=8000000000000000\n",
     {{INTERNAL_DEVICE, {"sdaf"}}, {OTHER_DEVICE, {"sdag", "sdbl"}}}},
    {"the 32nd disk by a high bit of the USB mask",
     "usbportcfg=0x4000000000000000\n",
     {{USB_DEVICE, {"sdaf"}}, {OTHER_DEVICE, {"sdae", "sdag"}}}},
    {"the 32nd disk by a high bit of the cache mask",
     "usbportcfg=1\ncacheportcfg=0x10000000000\n",
     {{CACHE_DEVICE, {"sdaf"}}, {OTHER_DEVICE, {"sdao", "sdag"}}}},
    {"disks beyond the 32nd match no mask",
     "internalportcfg=0xffffffffffffffff\nusbportcfg=0xffffffffffffffff\n"
     "cacheportcfg=0xffffffffffffffff\n",
     {{INTERNAL_DEVICE, {"sdaf"}}, {OTHER_DEVICE, {"sdag", "sdbl", "sdbm", "sdzz", "sdaaa"}}}},
    // One letter: its own bit. Two: the bit of the first letter, a for bit 0.
    {"eSATA bit 0",
     "usbportcfg=0x40000000\nesataportcfg=0x1\n",
     {{ESATA_DEVICE, {"sda", "sdaa", "sdaf", "sdaz", "sdae"}}, {OTHER_DEVICE, {"sdb", "sdba"}}}},
    {"eSATA bit 1",
     "usbportcfg=0x40000000\nesataportcfg=0x2\n",
     {{OTHER_DEVICE, {"sda", "sdaz", "sdca"}},
      {ESATA_DEVICE, {"sdb", "sdba", "sdbz"}},
      {USB_DEVICE, {"sdae"}}}},
    {"eSATA bit 25",
     "usbportcfg=0x40000000\nesataportcfg=0x2000000\n",
     {{ESATA_DEVICE, {"sdz", "sdza", "sdzz"}}, {OTHER_DEVICE, {"sdyz", "sdaaa"}}}},
    // 26 is sdaa's index, whose bit is 0; the bit itself is that of sdaaa (702 / 26 - 1 = 26).
    {"eSATA bit 26",
     "usbportcfg=0x40000000\nesataportcfg=0x4000000\n",
     {{OTHER_DEVICE, {"sdaa", "sdz", "sdaba"}}, {ESATA_DEVICE, {"sdaaa", "sdaaz"}}}},
    // sdafa is index 832, 832 / 26 - 1 = 31; sdaga 858, whose shift of 32 has no bit.
    {"eSATA bit 31 is not widened",
     "usbportcfg=0x40000000\nesataportcfg=0x80000000\n",
     {{ESATA_DEVICE, {"sdafa"}}, {OTHER_DEVICE, {"sdaf", "sdaga", "sdzzz"}}}},
    {"only the low half of the eSATA mask counts",
     "usbportcfg=0x40000000\nesataportcfg=0xffffffff00000000\n",
     {{OTHER_DEVICE, {"sda", "sdaf", "sdafa", "sdaga"}}, {USB_DEVICE, {"sdae"}}}},
    {"an eSATA mask of 0",
     "usbportcfg=0x2\nesataportcfg=0\ninternalportcfg=1\n",
     {{INTERNAL_DEVICE, {"sda"}}, {OTHER_DEVICE, {"sdaa"}}}},
    {"hexadecimal without 0x, in capitals, in quotes, with blanks",
     "usbportcfg=10\ninternalportcfg = \"0XF\"\ncacheportcfg=\t20 disks\r\n",
     {{INTERNAL_DEVICE, {"sda", "sdd"}},
      {USB_DEVICE, {"sde"}},
      {CACHE_DEVICE, {"sdf"}},
      {OTHER_DEVICE, {"sdk"}}}},
    {"values that are no numbers are 0",
     "usbportcfg=none\ninternalportcfg=xyz\ncacheportcfg=0xg\n",
     {{OTHER_DEVICE, {"sda"}}}},
    {"an empty USB value is one",
     "usbportcfg= \ninternalportcfg=1\n",
     {{INTERNAL_DEVICE, {"sda"}}, {OTHER_DEVICE, {"sdb"}}}},
    {"64 digits are read, and saturate",
     "usbportcfg=" + std::string(63, '0') + "1\ninternalportcfg=" + std::string(64, 'f') + "\n",
     {{INTERNAL_DEVICE, {"sda", "sdaf"}}, {OTHER_DEVICE, {"sdag"}}}},
    {"65 digits are no value",
     "usbportcfg=1\ninternalportcfg=" + std::string(64, '0') + "f\n",
     {{USB_DEVICE, {"sda"}}, {OTHER_DEVICE, {"sdb"}}}},
    {"the first of two lines decides",
     "usbportcfg=1\nusbportcfg=2\n#internalportcfg=2\ninternalportcfg=4\n",
     {{USB_DEVICE, {"sda"}}, {OTHER_DEVICE, {"sdb"}}, {INTERNAL_DEVICE, {"sdc"}}}},
};

TEST(ExternalDiskPortCheck, ClassifiesByTheMasksOfTheModel)
{
    for (const PORT_CASE &row : PORT_CASES) {
        SCOPED_TRACE(row.szTitle);
        ExpectTypes(MachineWithConf(row.conf), row.disks);
    }
}

// Behind "/dev" stands no further slash to look behind.
TEST(ExternalDiskPortCheck, KnowsNoOtherNames)
{
    ExpectTypes(MachineWithConf("usbportcfg=1\ninternalportcfg=1\n"),
                {{UNKNOWN_DEVICE,
                  {"hda", "/dev/hda1", "md0", "/dev/md2", "", "/dev/", "3", "xsda", "SDA",
                   "/dev/SDA", "/dev", "xnuroboot", "/dev/disk/sda"}}},
                NoMatch("hda") + NoMatch("hda") + NoMatch("md") + NoMatch("md") + NoMatch("") +
                    NoMatch("") + NoMatch("") + NoMatch("xsda") + NoMatch("SDA") + NoMatch("SDA") +
                    NoMatch("/dev") + NoMatch("xnuroboot") + NoMatch("disk/sda"));
}

TEST(ExternalDiskPortCheck, TakesPathsOfUpTo31Characters)
{
    const MACHINE machine = MachineWithConf("usbportcfg=1\n");
    ExpectTypes(machine, {{OTHER_DEVICE, {Letters(31), "/dev/" + Letters(26), Letters(30) + "1"}},
                          {MMC_DEVICE, {Letters(40) + "mmcblk"}}});
    ExpectTypes(machine,
                {{UNKNOWN_DEVICE,
                  {Letters(32), Letters(33), Letters(31) + "1", "/dev/" + Letters(27),
                   "nuroboot" + std::string(24, 'x')}}},
                5 * TOO_LONG);
}

// Two are told by their names alone.
TEST(ExternalDiskPortCheck, ClassifiesNothingWithoutTheUsbMask)
{
    const std::string others = "esataportcfg=1\ninternalportcfg=0xf\ncacheportcfg=0xff\n";
    for (const std::string &usb :
         {std::string(), std::string("usbportcfg=\n"), std::string("usbportcfg\n"),
          std::string("#usbportcfg=1\n"), "usbportcfg=" + std::string(65, '1') + "\n"}) {
        SCOPED_TRACE(usb);
        ExpectTypes(MachineWithConf(usb + others),
                    {{UNKNOWN_DEVICE, {"sda", "/dev/sdb1", "isda", "hda"}},
                     {BOOT_DEVICE, {"nuroboot"}},
                     {MMC_DEVICE, {"mmcblk0"}}},
                    4 * USB_MISSING);
    }
}

TEST(ExternalDiskPortCheck, ClassifiesNothingWithoutTheFile)
{
    ExpectTypes(Without(MachineMake(), "/etc.defaults"), {{UNKNOWN_DEVICE, {"sda"}}}, USB_MISSING);
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
    });
    ExpectSteps(result, NoMatch("nuroboot") + NoMatch("mmcblk0") + NoMatch("/dev/sda"));
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
    ExpectSteps(result, 2 * USB_MISSING);
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

// sdg is told loosely: its name is in sdga.
TEST(ExpansionUnit, ReportsTheDisksBehindAnEsataPort)
{
    MACHINE machine = MachineWithConf("usbportcfg=1\ninternalportcfg=0xfe\nesataportcfg=0x40\n");
    UnitAdd(machine, "host3", "/dev/sdga,/dev/sdgb");
    ExpectTypes(machine, {{EUNIT_DEVICE, {"sdga", "/dev/sdgb3", "sdg"}},
                          {ESATA_DEVICE, {"sdgc"}},
                          {INTERNAL_DEVICE, {"sdf"}},
                          {OTHER_DEVICE, {"sdfa"}}});
}

TEST(ExpansionUnit, DoesNotCountForDisksOfOtherPorts)
{
    MACHINE machine = MachineWithConf("usbportcfg=1\ninternalportcfg=0x40\n");
    UnitAdd(machine, "host0", "/dev/sdg,/dev/sda");
    ExpectTypes(machine, {{INTERNAL_DEVICE, {"sdg"}}, {USB_DEVICE, {"sda"}}});
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
    ExpectTypes(machine, {{EUNIT_DEVICE, {"sdb"}}});
    UnitAdd(machine, "host6", devices);
    ExpectTypes(machine, {{ESATA_DEVICE, {"sdb"}}});
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

MACHINE MachineWithFolders(const std::string &conf, const std::vector<std::string> &disks)
{
    MACHINE machine = MachineWithConf(conf);
    for (const std::string &disk : disks) {
        MachineFolder(machine, "/sys/block/" + disk);
    }
    return machine;
}

MACHINE MachineWithDisks()
{
    MACHINE machine =
        MachineWithFolders(ENUM_CONF, {"sdh",      "sdgb", "sdga", "sdg",     "sdf", "sde",  "sdd",
                                       "sdc",      "sdb",  "sdaf", "sda",     "sdi", "isdb", "isda",
                                       "nuroboot", "md0",  "sr0",  "mmcblk0", "hda", "sd"});
    UnitAdd(machine, "host0", "/dev/sdga,/dev/sdgc");
    return machine;
}

// What a list of 512 bytes holds behind the call; the items of `before` stand in it at first.
struct ENUM_CASE {
    const char *szName;
    DISK_PORT_TYPE type;
    std::string items;
    MACHINE machine = MachineWithDisks();
    std::string before = "";
    int fMode = SZLIST_SORTED;
    int result = 0;
    STEPS steps = {};
    int nSize = 512;
};

void PrintTo(const ENUM_CASE &row, std::ostream *pStream)
{
    *pStream << row.szName;
}

struct ExternalDiskPortEnumList : testing::TestWithParam<ENUM_CASE> {
};

TEST_P(ExternalDiskPortEnumList, Lists)
{
    const ENUM_CASE &row = GetParam();
    const RUN_RESULT result = MachineCall(row.machine, [&row] {
        PNLIBSZLIST pList = NLIBCSzListAlloc(512);
        std::istringstream before(row.before);
        for (std::string item; before >> item;) {
            (void)NLIBCSzListPush(&pList, item.c_str());
        }
        EXPECT_EQ(ExternalDiskPortEnum(row.type, &pList), row.result);
        EXPECT_EQ(ItemsOf(pList), row.items);
        EXPECT_EQ(pList->fMode, row.fMode);
        EXPECT_EQ(pList->nSize, row.nSize);
        NLIBCSzListFree(pList);
    });
    ExpectSteps(result, row.steps);
}

// 120 names: with their slots they need more than a list of 512 bytes has.
std::vector<std::string> ManyDisks()
{
    std::vector<std::string> disks;
    for (char first = 'b'; first < 'h'; first++) {
        for (char second = 'a'; second < 'u'; second++) {
            disks.push_back({'s', 'd', first, second});
        }
    }
    return disks;
}

std::string ManyItems()
{
    std::string items;
    for (const std::string &disk : ManyDisks()) {
        items += disk + " ";
    }
    return items;
}

const ENUM_CASE ENUM_CASES[] = {
    {"Internal", INTERNAL_DEVICE, "sda sdb sdc sdd "},
    {"Esata", ESATA_DEVICE, "sdgb "},
    {"Eunit", EUNIT_DEVICE, "sdg sdga "},
    {"Usb", USB_DEVICE, "sde sdf "},
    {"Boot", BOOT_DEVICE, "nuroboot "},
    {"Isd", ISD_DEVICE, "isda isdb "},
    {"Cache", CACHE_DEVICE, "sdh "},
    {"ByBytes", INTERNAL_DEVICE, "sda sdaa sdab sdb sdz ",
     MachineWithFolders("usbportcfg=0x80000000\ninternalportcfg=0x7fffffff\n",
                        {"sdb", "sdaa", "sdz", "sda", "sdab", "sdaf"})},
    {"AsMuchAsTheListGrows",
     ESATA_DEVICE,
     ManyItems(),
     MachineWithFolders("usbportcfg=1\nesataportcfg=0x3ffffff\n", ManyDisks()),
     "",
     SZLIST_SORTED,
     0,
     {},
     2048},
    {"NoDiskOfTheTypeSorted", INTERNAL_DEVICE, "", MachineWithFolders("usbportcfg=1\n", {"sdb"})},
    {"NothingButALineForEachDiskWithoutTheUsbMask", INTERNAL_DEVICE, "",
     MachineWithFolders("internalportcfg=0xf\n", {"sda", "sdb"}), "", SZLIST_SORTED, 0,
     2 * USB_MISSING},
};

INSTANTIATE_TEST_SUITE_P(, ExternalDiskPortEnumList, testing::ValuesIn(ENUM_CASES), ROW_NAME());

// The list stays as it was.
ENUM_CASE Refused(const char *szName, int type, const std::string &line, int error = 0)
{
    MACHINE machine = MachineWithDisks();
    STEPS steps = {{line}};
    if (error != 0) {
        machine.faults = {{.szFunction = "glob", .error = error}};
        steps = STEPS{{"fault glob 1"}} + steps;
    }
    return {szName, static_cast<DISK_PORT_TYPE>(type), "b ", machine, "b", SZLIST_UNSORTED, -1,
            steps};
}

constexpr char NO_TYPE[] = "<11>disk_port.cpp:# disk port type doesn't exist";
constexpr char NO_MEMORY[] =
    "<11>disk_port.cpp:# out of memory to alloc glob function when looking for:";

// Without memory for the matches, or with a folder that cannot be read.
const ENUM_CASE REFUSED_CASES[] = {
    Refused("Type0", 0, NO_TYPE),
    Refused("Type8", 8, NO_TYPE),
    Refused("Type9", 9, NO_TYPE),
    Refused("Type10", 10, NO_TYPE),
    Refused("Type15", 15, NO_TYPE),
    Refused("Unread", INTERNAL_DEVICE, "<11>disk_port.cpp:# read error :/sys/block/sd*", EIO),
    Refused("UnreadIsd", ISD_DEVICE, "<11>disk_port.cpp:# read error :/sys/block/isd*", EIO),
    Refused("UnreadBoot", BOOT_DEVICE, "<11>disk_port.cpp:# read error :/sys/block/nuroboot", EIO),
    Refused("NoMemory", CACHE_DEVICE, std::string(NO_MEMORY) + "/sys/block/sd*", ENOMEM),
    Refused("NoMemoryBoot", BOOT_DEVICE, std::string(NO_MEMORY) + "/sys/block/nuroboot", ENOMEM),
};

INSTANTIATE_TEST_SUITE_P(Refused, ExternalDiskPortEnumList, testing::ValuesIn(REFUSED_CASES),
                         ROW_NAME());

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

TEST(ExternalDiskPortEnum, LeavesTheListAloneWhereNoDiskIs)
{
    const MACHINE machine = MachineWithFolders(ENUM_CONF, {"md0"});
    for (const MACHINE &blank : {machine, Without(machine, "/sys/block")}) {
        QuietCall(blank, [] {
            PNLIBSZLIST pList = NLIBCSzListAlloc(512);
            (void)NLIBCSzListPush(&pList, "b");
            (void)NLIBCSzListPush(&pList, "a");
            for (int type = INTERNAL_DEVICE; type <= CACHE_DEVICE; type++) {
                EXPECT_EQ(ExternalDiskPortEnum(static_cast<DISK_PORT_TYPE>(type), &pList), 0)
                    << type;
            }
            EXPECT_EQ(ItemsOf(pList), "b a ");
            EXPECT_EQ(pList->fMode, SZLIST_UNSORTED);
            NLIBCSzListFree(pList);
        });
    }
}

TEST(IsSupportSas, IsAskedOnceInAProcess)
{
    const std::string yes = "supportsas=\"YES\"\n";
    const std::string no = "supportsas=no\n";
    const struct {
        std::string conf;
        int fSas;
        std::string later;
    } rows[] = {{yes, 1, no}, {no, 0, yes}, {"supportsas=yesno\n", 0, yes}, {"", 0, yes}};
    for (const auto &row : rows) {
        QuietCall(MachineWithConf(row.conf), [&row] {
            EXPECT_EQ(IsSupportSas(), row.fSas);
            ConfRewrite(row.later);
            EXPECT_EQ(IsSupportSas(), row.fSas);
        });
    }
}

} // namespace
