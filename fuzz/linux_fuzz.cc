// One file of a Linux machine holds any bytes: the input's first byte names the file, in a tree
// that is otherwise whole. Everything that is made of it is asked for.
#include <string.h>

#include "read_host.h"
#include "surroundings.h"

namespace {

constexpr size_t kMostPrefixes = 5;

struct Target {
  char letter;
  const char *path;
  const char *nodes[kMostPrefixes];
  const char *whole;  // what the file holds while another one is under test
};

#define FUNCTION "/sys/bus/pci/devices/0000:00:1f.2"
#define THREAD(id) id " (a) S 0 1 1 0 -1 0 0 0 0 0 1 2 0 0 20 0 2 0 9 9\n"

constexpr Target kTargets[] = {
    {'a', "/proc/uptime", {"system_ntpclock"}, "5.5 6.6\n"},
    {'b', "/proc/loadavg", {"sched_groups"}, "0.1 0.2 0.3 1/2 3\n"},
    {'c', "/proc/1/task/1/stat", {"world", "userworld_cartel", "sched_Vcpus"}, THREAD("1")},
    {'d', "/proc/1/task/2/stat", {"world", "sched_Vcpus"}, THREAD("2")},
    {'e', "/proc/1/cmdline", {"world", "userworld_cartel"}, "/sbin/init"},
    {'f', "/proc/1/task/1/status", {"world", "sched_Vcpus"}, "Name:\ta\nCpus_allowed_list:\t0-3\n"},
    {'g', "/proc/1/maps", {"userworld_cartel"}, "1000-2000 rw-p 00000000 00:00 0 /a\n"},
    {'m', "/proc/interrupts", {"hardware_int"}, " CPU0 CPU1\n 1: 2 3 IO-APIC 1-edge i8042\n"},
    {'n', "/proc/modules", {"system_modules", "hardware_pci"}, "ahci 40960 2 - Live 0x0\n"},
    {'o', "/proc/self/mountinfo", {"system_morelfs"}, "1 0 0:1 / / rw - tmpfs tmpfs rw\n"},
    {'p', FUNCTION "/config", {"hardware_pci"}, "\x86\x80\x22\x29"},
    {'q', FUNCTION "/uevent", {"hardware_pci"}, "DRIVER=ahci\n"},
    {'r', FUNCTION "/class", {"hardware_pci"}, "0x010601\n"},
    {'s', FUNCTION "/irq", {"hardware_pci"}, "16\n"},
    {'t', "/sys/bus/pci/slots/3/address", {"hardware_pci"}, "0000:00:1f\n"},
    {'u', "/proc/cmdline", {"system_boot"}, "BOOT_IMAGE=/k audit=1 BOOTIF=01-02-03-04-05-06-07\n"},
    {'v', "/etc/default/grub", {"system_bootOptionFiles"}, "GRUB_TIMEOUT=5\n"},
    {'w', "/proc/version", {"system_version"}, "Linux version 6.1 #1 SMP (2024-01-02)\n"},
    {'x', "/proc/sys/kernel/version", {"system_version"}, "#1 SMP Debian 6.1.1-1 (2024-01-02)\n"},
    {'y', "/proc/sys/kernel/osrelease", {"system_version", "system_boot"}, "6.1.0\n"},
    {'z', "/sys/class/rtc/rtc0/date", {"hardware_chipset"}, "2024-01-02\n"},
    {'A', "/sys/class/rtc/rtc0/time", {"hardware_chipset"}, "01:02:03\n"},
    {'B', "/sys/devices/system/cpu/online", {"hardware_cpu", "sched_globalStats"}, "0-3\n"},
    {'C', "/sys/firmware/acpi/tables/DSDT", {"hardware_acpi"}, "DSDT"},
    {'D', "/sys/dev/block/7:0/size", {"system_morelfs"}, "100\n"},
    {'E', FUNCTION "/subsystem_vendor", {"hardware_pci"}, "0x8086\n"},
    {'F', FUNCTION "/power_state", {"hardware_pci"}, "D0\n"},
};

void Restore(const Target &target) {
  Write(target.path, target.whole, strlen(target.whole));
}

const bool isWhole = [] {
  for (const Target &target : kTargets) Restore(target);
  for (const char *empty : {"/proc/1/fd", "/boot/loader/entries"}) {
    std::filesystem::create_directories(folder + empty);
  }
  Write(FUNCTION "/vendor", "0x8086\n", 7);
  Write(FUNCTION "/device", "0x2922\n", 7);
  setenv("ZELLIBS_HOST", ("linux:" + folder).c_str(), 1);
  return symlink("../../../../bus/pci/drivers/ahci", (folder + FUNCTION "/driver").c_str()) == 0;
}();

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  if (size == 0) return 0;
  if (!isWhole) abort();
  for (const Target &target : kTargets) {
    if (target.letter != static_cast<char>(data[0])) continue;
    Write(target.path, data + 1, size - 1);
    ReadHost(target.nodes);
    Restore(target);
    return 0;
  }
  return -1;  // names no file: not worth keeping
}
