// The interrupts, ACPI tables, boot facts, version and clock of a Linux machine: from trees of
// files, and against this machine's own files.
#include <sys/stat.h>
#include <sys/utsname.h>
#include <unistd.h>

#include <filesystem>
#include <sstream>

#include "host_fixture.h"

namespace {

class PlatformHostTest : public HostTest {
 protected:
  Outcome OnTree(const std::vector<std::string> &arguments, Surroundings surroundings = {}) {
    return Linux(Scratch() + "/root", arguments, std::move(surroundings));
  }

  std::string InterruptRows(const std::string &rows) {
    WriteFile("root/sys/devices/system/cpu/online", "0,2\n");
    WriteFile("root/proc/interrupts", rows);
    const Outcome outcome = OnTree({"irqinfo"});
    EXPECT_EQ(outcome.status, 0) << outcome.err;
    return outcome.out.substr(outcome.out.find('\n') + 1);
  }
};

TEST_F(PlatformHostTest, InterruptRows) {
  EXPECT_EQ(
      InterruptRows("            CPU0       CPU2       \n"
                    "   0:        123          4   IO-APIC    2-edge      timer\n"
                    "  16:   12345678 9876543210   IO-APIC   16-fasteoi   i801_smbus, ahci\n"
                    "  17:          0          9   IO-APIC   17-fasteoi \n"
                    "  27:          5          6    GICv3     27 Level     arch_timer\n"
                    "  28:          5          6    GICv3     28 Level     \n"
                    "  30:          7          8    PCI-MSI 524288-edge      PCIe PME, pciehp\n"
                    "  31:          0          1  xen-dyn    -event     eth0-q0-rx\n"
                    "  32:          0          1  xen-dyn    -event\n"
                    " 300:          1          2      None\n"
                    " 301:          1          2  my-chip       3  driver 5-edge\x07\n"
                    " NMI:          0          0   Non-maskable interrupts\n"
                    " ERR:          0\n"),
      "0x0000:       123          4 ZLK timer\n"
      "0x0010:  12345678 9876543210 ZLK i801_smbus, ZLK ahci\n"
      "0x0011:         0          9 \n"
      "0x001b:         5          6 ZLK arch_timer\n"
      "0x001c:         5          6 \n"
      "0x001e:         7          8 ZLK PCIe PME, ZLK pciehp\n"
      "0x001f:         0          1 ZLK eth0-q0-rx\n"
      "0x0020:         0          1 \n"
      "0x012c:         1          2 \n"
      "0x012d:         1          2 ZLK driver 5-edge?\n");
}

// A column that a row lacks is no count.
TEST_F(PlatformHostTest, TruncatedInterruptRows) {
  EXPECT_EQ(InterruptRows("  CPU0 CPU2\n  1:   5\n  2:   6   7"),
            "0x0001:         5            \n0x0002:         6          7 \n");
  EXPECT_EQ(InterruptRows(""), "");
}

TEST_F(PlatformHostTest, ThisMachinesInterrupts) {
  std::istringstream lines(ReadFile("/proc/interrupts"));
  std::vector<std::string> numbers;
  for (std::string line; std::getline(lines, line);) {
    const size_t colon = line.find(':');
    const size_t digits = line.find_first_not_of(' ');
    if (colon != line.npos && isdigit(line[digits])) {
      numbers.push_back(line.substr(digits, colon - digits));
    }
  }
  if (numbers.empty()) GTEST_SKIP() << "no interrupts";
  std::istringstream rows(Linux("/", {"irqinfo"}).out);
  std::string row;
  std::getline(rows, row);
  for (const std::string &number : numbers) {
    ASSERT_TRUE(std::getline(rows, row));
    const unsigned long cookie = std::stoul(row, nullptr, 16);
    EXPECT_EQ(std::to_string(cookie), number);
    // The kernel's own place for the names, where it has them.
    std::string devices = ReadFile("/sys/kernel/irq/" + number + "/actions");
    if (devices.empty()) continue;
    devices = devices.substr(0, devices.find_first_of(",\n"));
    EXPECT_NE(row.find("ZLK " + devices), std::string::npos) << row;
  }
  EXPECT_FALSE(std::getline(rows, row));
}

TEST_F(PlatformHostTest, AcpiTables) {
  const std::string tables = "root/sys/firmware/acpi/tables/";
  const std::string big = "SSDT" + std::string(131075 * 2, 'x') + "end";
  WriteFile(tables + "SSDT1", big);
  WriteFile(tables + "SSDT2", "SSDT, the second");
  WriteFile(tables + "DSDT", std::string(131075, 'd'));
  WriteFile(tables + "dynamic/SSDT3", "SSDT, added later");
  WriteFile(tables + "data/BERT", "no table");
  WriteFile("out/none", "");
  const Outcome outcome = OnTree({"amldump"}, {.directory = Scratch() + "/out"});
  EXPECT_EQ(outcome.out,
            "Writing file DSDT.aml\nWriting file SSDT.aml\nWriting file SSDT-1.aml\n"
            "Writing file SSDT-2.aml\n");
  EXPECT_EQ(outcome.status, 0) << outcome.err;
  EXPECT_EQ(ReadFile(Scratch() + "/out/DSDT.aml"), std::string(131075, 'd'));
  EXPECT_EQ(ReadFile(Scratch() + "/out/SSDT.aml"), big);
  EXPECT_EQ(ReadFile(Scratch() + "/out/SSDT-1.aml"), "SSDT, the second");
  EXPECT_EQ(ReadFile(Scratch() + "/out/SSDT-2.aml"), "SSDT, added later");
}

TEST_F(PlatformHostTest, ThisMachinesAcpiTables) {
  const std::string tables = "/sys/firmware/acpi/tables/";
  if (access((tables + "DSDT").c_str(), R_OK) != 0) GTEST_SKIP() << "no ACPI, or not root";
  WriteFile("out/none", "");
  EXPECT_EQ(Linux("/", {"amldump"}, {.directory = Scratch() + "/out"}).status, 0);
  for (const auto &entry : std::filesystem::directory_iterator(tables)) {
    const std::string name = entry.path().filename();
    if (!entry.is_regular_file() || name.size() != 4) continue;
    EXPECT_EQ(ReadFile(Scratch() + "/out/" + name + ".aml"), ReadFile(entry.path())) << name;
  }
  if (!IsInstalled("iasl")) return;
  EXPECT_EQ(Run({"iasl", "-d", "DSDT.aml"}, {.directory = Scratch() + "/out"}).status, 0);
}

TEST_F(PlatformHostTest, BootFacts) {
  const auto boot = [this](const std::string &line, std::vector<std::string> options) {
    WriteFile("root/proc/cmdline", line);
    WriteFile("root/proc/version", "Linux version 6.1.0-9-amd64 (a@b) (gcc) #7 SMP (2023-05-08)\n");
    options.insert(options.begin(), {"bootOption", "-r"});
    const Outcome outcome = OnTree(options);
    EXPECT_EQ(outcome.status, 0) << outcome.err;
    return outcome.out;
  };
  EXPECT_EQ(boot("BOOT_IMAGE=/boot/vmlinuz-6.1 root=/dev/sda1 ro\n", {"-ko"}),
            "/boot/vmlinuz-6.1\nroot=/dev/sda1 ro\n");
  EXPECT_EQ(boot("ro BOOT_IMAGE=x\x1b\n", {"-ko"}), "vmlinuz-6.1.0-9-amd64\nro BOOT_IMAGE=x?\n");
  EXPECT_EQ(boot("\n", {"-ko"}), "vmlinuz-6.1.0-9-amd64\n\n");
  EXPECT_EQ(boot(std::string(5000, 'x'), {"-o"}), std::string(4095 - 22, 'x') + "\n");

  EXPECT_EQ(boot("audit=1 fsck.mode=force BOOTIF=01-52-54-00-12-34-56\n", {"-afp"}),
            "1\n1\n0\n1\n");
  EXPECT_EQ(boot("xaudit=1 audit=10 fsck.mode=forced opt=\"x BOOTIF=1\"\n", {"-afp"}),
            "0\n0\n0\n0\n");
  EXPECT_EQ(boot("audit=1 audit=0\n", {"-i"}), "0\n");
}

TEST_F(PlatformHostTest, BootOptionFiles) {
  WriteFile("root/etc/kernel/cmdline", "ro quiet\n");
  WriteFile("root/boot/loader/entries/b.conf", "title b\nversion 2\n");
  WriteFile("root/boot/loader/entries/a.conf", "");
  WriteFile("root/boot/loader/entries/a.conf.bak", "");
  WriteFile("root/boot/loader/entries/.c.conf", "");
  WriteFile("root/boot/grub/grub.cfg", "set x\n");
  WriteFile("root/etc/shadow", "secret\n");
  // What is no file is not listed; a link means a place in the tree.
  const std::string entries = Scratch() + "/root/boot/loader/entries/";
  std::filesystem::create_directory(entries + "folder.conf");
  ASSERT_EQ(mkfifo((entries + "pipe.conf").c_str(), 0600), 0);
  ASSERT_EQ(symlink("nowhere", (entries + "broken.conf").c_str()), 0);
  ASSERT_EQ(symlink("/etc/kernel/cmdline", (entries + "c.conf").c_str()), 0);
  ASSERT_EQ(symlink("/etc/hostname", (entries + "d.conf").c_str()), 0);
  EXPECT_EQ(OnTree({"bootOption", "-rb"}).out,
            "/boot/grub/grub.cfg /boot/loader/entries/a.conf /boot/loader/entries/b.conf "
            "/boot/loader/entries/c.conf /etc/kernel/cmdline \n");
  EXPECT_EQ(OnTree({"bootOption", "-rC"}).out, "set x   title b version 2  ro quiet  ro quiet  ");
  for (const char *other : {"/etc/shadow", "/boot/loader/entries/../../../etc/shadow.conf",
                            "/boot/loader/entries/x.conf", "/etc/default/grub"}) {
    const Outcome outcome = OnTree({"bootOption", "-rc", other});
    EXPECT_EQ(outcome.out, std::string("Invalid boot option file name ") + other + "\n");
    EXPECT_EQ(outcome.status, 1);
  }
}

TEST_F(PlatformHostTest, ThisMachinesBoot) {
  std::string line = ReadFile("/proc/cmdline");
  line.resize(line.find_last_not_of('\n') + 1);
  if (line.starts_with("BOOT_IMAGE=")) line.erase(0, line.find(' ') + 1);
  EXPECT_EQ(Linux("/", {"bootOption", "-ro"}).out, line + "\n");
}

TEST_F(PlatformHostTest, Versions) {
  const auto version = [this](const char *option) { return OnTree({"zelvar", option}); };
  EXPECT_EQ(version("-v").status, 1);  // a tree that does not tell
  WriteFile(
      "root/proc/version",
      "Linux version 6.1.0-9-amd64 (d@d.org) (gcc-12, ld #2) #29~22.04 SMP Debian 6.1.27-1\n");
  EXPECT_EQ(version("-v").out, "Linux 6.1.0-9-amd64 build-00029\n");
  EXPECT_EQ(version("-l").out, "Linux 6.1.0-9-amd64 GA\n");
  WriteFile("root/proc/sys/kernel/ostype", "Linux\n");
  WriteFile("root/proc/sys/kernel/osrelease", "5.10.0\n");
  WriteFile("root/proc/sys/kernel/version", "#3 SMP Fri Nov 22 15:44:03 UTC 2024\n");
  EXPECT_EQ(version("-v").out, "Linux 5.10.0 build-00003\n");
}

TEST_F(PlatformHostTest, ThisMachinesVersion) {
  utsname name;
  ASSERT_EQ(uname(&name), 0);
  const std::string expected = std::string(name.sysname) + " " + name.release + " build-";
  EXPECT_EQ(Linux("/", {"zelvar", "-v"}).out.substr(0, expected.size()), expected);
}

TEST_F(PlatformHostTest, Clocks) {
  const std::string clock = "root/sys/class/rtc/rtc0/";
  WriteFile("root/proc/uptime", "1.00 1.00\n");
  EXPECT_EQ(OnTree({"hwclock"}).out, "KIF_Get error: 0xbad0003\n");
  WriteFile(clock + "date", "2024-11-02\n");
  WriteFile(clock + "time", "05:06:07\n");
  EXPECT_EQ(OnTree({"hwclock"}).out, "05:06:07   11/02/2024   UTC\n");
  EXPECT_EQ(OnTree({"hwclock", "-t", "1:2:3"}).out, "KIF_Set error: 0xbad0004\n");
  WriteFile(clock + "time", "05:06\n");
  EXPECT_EQ(OnTree({"hwclock"}).out, "KIF_Get error: 0xbad0010\n");
}

TEST_F(PlatformHostTest, ThisMachinesClock) {
  if (access("/sys/class/rtc/rtc0/date", R_OK) != 0) {
    EXPECT_EQ(Linux("/", {"hwclock"}).out, "KIF_Get error: 0xbad0003\n");
    return;
  }
  const std::string date = ReadFile("/sys/class/rtc/rtc0/date");
  const std::string expected =
      date.substr(5, 2) + "/" + date.substr(8, 2) + "/" + date.substr(0, 4);
  EXPECT_NE(Linux("/", {"hwclock"}).out.find(expected), std::string::npos);
}

}  // namespace
