// One file of a Linux machine holds any bytes: the input's first byte names the file, in a tree
// that is otherwise whole. Everything that is made of it is asked for.
#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <string>

#include "read_host.h"
#include "zellibs.h"

namespace {

constexpr size_t kMostPrefixes = 5;

struct Target {
  char letter;
  const char *path;
  const char *whole;  // what the file holds while another one is under test; null: no such file
  const char *nodes[kMostPrefixes];
};

#define FUNCTION "/sys/bus/pci/devices/0000:00:1f.2"

constexpr Target kTargets[] = {
    {'a', "/proc/uptime", "5.5 6.6\n", {"system_ntpclock"}},
    {'b', "/proc/loadavg", "0.1 0.2 0.3 1/2 3\n", {"sched_groups"}},
    {'c',
     "/proc/1/task/1/stat",
     "1 (a) S 0 1 1 0 -1 0 0 0 0 0 1 2 0 0 20 0 2 0 9 9\n",
     {"world", "userworld_cartel", "sched_Vcpus"}},
    {'d',
     "/proc/1/task/2/stat",
     "2 (b) R 0 1 1 0 -1 0 0 0 0 0 1 2 0 0 20 0 2 0 9 9\n",
     {"world", "sched_Vcpus"}},
    {'e', "/proc/1/cmdline", "/sbin/init", {"world", "userworld_cartel"}},
    {'f', "/proc/1/task/1/status", "Name:\ta\nCpus_allowed_list:\t0-3\n", {"world", "sched_Vcpus"}},
    {'g', "/proc/1/maps", "1000-2000 rw-p 00000000 00:00 0 /a\n", {"userworld_cartel"}},
    {'m', "/proc/interrupts", " CPU0 CPU1\n 1: 2 3 IO-APIC 1-edge i8042\n", {"hardware_int"}},
    {'n', "/proc/modules", "ahci 40960 2 - Live 0x0\n", {"system_modules", "hardware_pci"}},
    {'o', "/proc/self/mountinfo", "1 0 0:1 / / rw - tmpfs tmpfs rw\n", {"system_morelfs"}},
    {'p', FUNCTION "/config", nullptr, {"hardware_pci"}},
    {'q', FUNCTION "/uevent", "DRIVER=ahci\n", {"hardware_pci"}},
    {'r', FUNCTION "/class", "0x010601\n", {"hardware_pci"}},
    {'s', FUNCTION "/irq", "16\n", {"hardware_pci"}},
    {'t', "/sys/bus/pci/slots/3/address", "0000:00:1f\n", {"hardware_pci"}},
    {'u',
     "/proc/cmdline",
     "BOOT_IMAGE=/vmlinuz audit=1 BOOTIF=01-02-03-04-05-06-07\n",
     {"system_boot"}},
    {'v', "/etc/default/grub", "GRUB_TIMEOUT=5\n", {"system_bootOptionFiles"}},
    {'w',
     "/proc/version",
     "Linux version 6.1 #1 SMP Debian 6.1.1-1 (2024-01-02)\n",
     {"system_version"}},
    {'x', "/proc/sys/kernel/version", "#1 SMP Debian 6.1.1-1 (2024-01-02)\n", {"system_version"}},
    {'y', "/proc/sys/kernel/osrelease", "6.1.0\n", {"system_version", "system_boot"}},
    {'z', "/sys/class/rtc/rtc0/date", "2024-01-02\n", {"hardware_chipset"}},
    {'A', "/sys/class/rtc/rtc0/time", "01:02:03\n", {"hardware_chipset"}},
    {'B', "/sys/devices/system/cpu/online", "0-3\n", {"hardware_cpu", "sched_globalStats"}},
    {'C', "/sys/firmware/acpi/tables/DSDT", "DSDT", {"hardware_acpi"}},
    {'D', "/sys/dev/block/7:0/size", "100\n", {"system_morelfs"}},
    {'E', FUNCTION "/subsystem_vendor", "0x8086\n", {"hardware_pci"}},
    {'F', FUNCTION "/power_state", "D0\n", {"hardware_pci"}},
};

std::string root = "/dev/shm/linux_fuzz.XXXXXX";

void Write(const char *path, const void *bytes, size_t size) {
  const int file = open((root + path).c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
  if (file == -1 || write(file, bytes, size) != static_cast<ssize_t>(size)) abort();
  close(file);
}

void Restore(const Target &target) {
  if (target.whole != nullptr) {
    Write(target.path, target.whole, strlen(target.whole));
  } else {
    unlink((root + target.path).c_str());
  }
}

void MakeTree() {
  for (const Target &target : kTargets) {
    std::filesystem::create_directories(std::filesystem::path(root + target.path).parent_path());
    Restore(target);
  }
  for (const char *folder : {"/proc/1/fd", "/boot/loader/entries"}) {
    std::filesystem::create_directories(root + folder);
  }
  if (symlink("../../../../bus/pci/drivers/ahci", (root + FUNCTION "/driver").c_str()) != 0)
    abort();
  Write(FUNCTION "/vendor", "0x8086\n", 7);
  Write(FUNCTION "/device", "0x2922\n", 7);
}

void RemoveTree() {
  std::error_code ignored;
  std::filesystem::remove_all(root, ignored);
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int *, char ***) {
  if (mkdtemp(root.data()) == nullptr) return 1;
  atexit(RemoveTree);
  MakeTree();
  setenv("ZELLIBS_HOST", ("linux:" + root).c_str(), 1);
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  if (size == 0) return 0;
  for (const Target &target : kTargets) {
    if (target.letter != static_cast<char>(data[0])) continue;
    Write(target.path, data + 1, size - 1);
    ReadHost(target.nodes);
    Restore(target);
    return 0;
  }
  return -1;  // names no file: not worth keeping
}
