// PCI functions and modules of a Linux machine, from trees of files.
#include <filesystem>

#include "host_fixture.h"

namespace {

class PciHostTest : public HostTest {
 protected:
  // A function's folder below the scratch folder.
  static std::string Folder(const std::string &address) {
    return "root/sys/bus/pci/devices/" + address + "/";
  }

  // Writes the attributes that every function has; `size` is that of its configuration space.
  void AddFunction(const std::string &address, const std::string &classCode, size_t size = 256,
                   char headerType = 0) {
    std::string config(size, '\0');
    config.replace(0, 4, "\x86\x80\x37\x12", 4);
    config[11] = static_cast<char>(std::stoi(classCode.substr(0, 2), nullptr, 16));
    config[10] = static_cast<char>(std::stoi(classCode.substr(2), nullptr, 16));
    config[14] = headerType;
    if (headerType == 1) config[25] = 7;
    if (headerType == 0) config.replace(44, 4, "\xf4\x1a\x00\x11", 4);
    config[60] = 11;
    config[61] = 2;
    WriteFile(Folder(address) + "config", config);
    WriteFile(Folder(address) + "class", "0x" + classCode + "00\n");
    WriteFile(Folder(address) + "irq", "19\n");
    WriteFile(Folder(address) + "power_state", "D0\n");
  }

  void Bind(const std::string &address, const std::string &driver) {
    std::filesystem::create_symlink("../../../bus/pci/drivers/" + driver,
                                    Scratch() + "/" + Folder(address) + "driver");
  }

  std::string List(const std::vector<std::string> &arguments) {
    const Outcome outcome = Linux(Scratch() + "/root", arguments);
    EXPECT_EQ(outcome.err, "");
    EXPECT_EQ(outcome.status, 0);
    return outcome.out;
  }

  // The detail line of a function, without the two header lines.
  std::string Details() {
    const std::string out = List({"lspci", "-p"});
    return out.substr(out.find('\n', out.find('\n') + 1) + 1);
  }
};

TEST_F(PciHostTest, AddressesAscendByNumber) {
  for (const char *address : {"10000:00:00.0", "0000:10:00.0", "0000:09:1f.7", "0000:09:1f.2",
                              "0000:09:02.0", "0001:00:00.0", "not a function"}) {
    AddFunction(address, "0780");
  }
  EXPECT_EQ(List({"lspci", "-n"}),
            "0000:09:02.0 Class 0780: 8086:1237 \n"
            "0000:09:1f.2 Class 0780: 8086:1237 \n"
            "0000:09:1f.7 Class 0780: 8086:1237 \n"
            "0000:10:00.0 Class 0780: 8086:1237 \n"
            "0001:00:00.0 Class 0780: 8086:1237 \n"
            "10000:00:00.0 Class 0780: 8086:1237 \n");
}

TEST_F(PciHostTest, NoBusIsNotFound) {
  WriteFile("root/proc/uptime", "1.00 1.00\n");
  const Outcome outcome = Linux(Scratch() + "/root", {"lspci"});
  EXPECT_EQ(outcome.err, "ListPCI: error fetching PCI seg list 0xbad0003\n");
  EXPECT_EQ(outcome.status, 1);
}

TEST_F(PciHostTest, InterruptsAndBridges) {
  AddFunction("0000:00:01.0", "0601");
  AddFunction("0000:00:02.0", "0604", 256, 1);
  WriteFile(Folder("0000:00:02.0") + "irq", "255\n");
  WriteFile(Folder("0000:00:02.0") + "msi_irqs/309", "msi\n");
  WriteFile(Folder("0000:00:02.0") + "msi_irqs/1310", "msi\n");
  EXPECT_EQ(Details(),
            "0000:00:01.0 8086:1237 1af4:1100  11/   /     B U              \n"
            "0000:00:02.0 8086:1237 0000:0000  11/   /0x35 B U              \n"
            "                                  07           \n");
}

// The kernel knows of virtual functions what they do not show themselves.
TEST_F(PciHostTest, AttributesGoBeforeTheFunctionsOwnAccount) {
  AddFunction("0000:00:01.0", "0780");
  WriteFile(Folder("0000:00:01.0") + "vendor", "0x15b3\n");
  WriteFile(Folder("0000:00:01.0") + "device", "0x1018\n");
  WriteFile(Folder("0000:00:01.0") + "class", "0x020000\n");
  AddFunction("0000:00:02.0", "0780", 256, 1);
  Bind("0000:00:02.0", "ahci");
  WriteFile(Folder("0000:00:02.0") + "uevent",
            "DRIVER=ahci\nPCI_CLASS=60400\nPCI_ID=1234:1111\nPCI_SUBSYS_ID=1AF4:1101\n");
  EXPECT_EQ(List({"lspci", "-n"}),
            "0000:00:01.0 Class 0200: 15b3:1018 \n"
            "0000:00:02.0 Class 0604: 1234:1111 \n");
  EXPECT_EQ(Details(),
            "0000:00:01.0 15b3:1018 1af4:1100  11/   /     B U              \n"
            "0000:00:02.0 1234:1111 1af4:1101  11/   /     B V ahci         \n"
            "                                  07           \n");
}

// A sleeping function is not woken: here its configuration space would even fail to open.
TEST_F(PciHostTest, SleepingFunctionsAreLeftAsleep) {
  AddFunction("0000:00:01.0", "0604", 256, 1);
  const std::string folder = Folder("0000:00:01.0");
  std::filesystem::remove(Scratch() + "/" + folder + "config");
  std::filesystem::create_directory(Scratch() + "/" + folder + "config");
  WriteFile(folder + "vendor", "0x8086\n");
  WriteFile(folder + "device", "0x1901\n");
  WriteFile(folder + "power_state", "D3cold\n");
  EXPECT_EQ(Details(), "0000:00:01.0 8086:1901 0000:0000                U              \n");
}

TEST_F(PciHostTest, OwnersAndNames) {
  WriteFile("root/proc/modules",
            "snd 1 0 - Live 0x0000000000000000\n"
            "snd_hda_intel 1 0 - Live 0x0000000000000000\n");
  AddFunction("0000:00:01.0", "0200");  // built in, its card behind a bus of its own
  Bind("0000:00:01.0", "virtio-pci");
  WriteFile(Folder("0000:00:01.0") + "virtio0/net/eth10/mtu", "");
  WriteFile(Folder("0000:00:01.0") + "virtio0/net/eth2/mtu", "");
  AddFunction("0000:00:02.0", "0403");  // loaded, named with other hyphens
  Bind("0000:00:02.0", "snd-hda-intel");
  WriteFile(Folder("0000:00:02.0") + "sound/card1/id", "");
  AddFunction("0000:00:03.0", "0300");  // the console, given to guests
  Bind("0000:00:03.0", "vfio-pci");
  WriteFile(Folder("0000:00:03.0") + "boot_vga", "1\n");
  AddFunction("0000:00:04.0", "0106");  // given to guests
  Bind("0000:00:04.0", "pci-stub");
  AddFunction("0000:00:05.0", "0106");  // built in, before the others by name
  Bind("0000:00:05.0", "ahci");
  WriteFile(Folder("0000:00:05.0") + "ata1/host0/uevent", "");
  AddFunction("0000:00:06.0", "0300");
  Bind("0000:00:06.0", "drv\x1b[31m");
  WriteFile(Folder("0000:00:06.0") + "drm/card0-HDMI-A-1/status", "");
  WriteFile(Folder("0000:00:06.0") + "drm/renderD128/dev", "");
  WriteFile(Folder("0000:00:06.0") + "drm/card0/dev", "");
  const std::string numbers = " 8086:1237 1af4:1100  11/   /     B ";
  EXPECT_EQ(Details(), "0000:00:01.0" + numbers + "V virtio-pci   eth2\n" + "0000:00:02.0" +
                           numbers + "V snd_hda_intel card1\n" + "0000:00:03.0" + numbers +
                           "C vfio-pci     \n" + "0000:00:04.0" + numbers + "P pci-stub     \n" +
                           "0000:00:05.0" + numbers + "V ahci         host0\n" + "0000:00:06.0" +
                           numbers + "V drv?[31m     card0\n");
}

TEST_F(PciHostTest, PhysicalSlots) {
  AddFunction("0000:03:00.1", "0200");
  AddFunction("0000:04:00.0", "0200");
  AddFunction("0000:05:00.0", "0200");
  WriteFile("root/sys/bus/pci/slots/7-1/address", "0000:03:00\n");
  WriteFile("root/sys/bus/pci/slots/12/address", "0000:05\n");
  WriteFile("root/sys/bus/pci/slots/broken/address", "0000:04:00\n");
  const auto slot = [this](const char *bus, const char *function) {
    return List({"pci-info", "-b", bus, "-s", "0", "-f", function, "-S"});
  };
  EXPECT_EQ(slot("3", "1"), "  7");
  EXPECT_EQ(slot("4", "0"), " -1");
  EXPECT_EQ(slot("5", "0"), " 12");
}

TEST_F(PciHostTest, ConfigurationSpaces) {
  AddFunction("0000:00:01.0", "0200", 64);
  AddFunction("0000:00:02.0", "0200", 256);
  AddFunction("0000:00:03.0", "0200", 4096);
  const auto read = [this](const char *slot, const char *option) {
    return Linux(Scratch() + "/root", {"pci-info", "-b", "0", "-s", slot, "-f", "0", option});
  };
  const std::string failure = ": error fetching PCI information ";
  EXPECT_EQ(read("1", "-c").err, "PrintConfigSpace" + failure + "0xbad000f\n");
  EXPECT_EQ(read("1", "-e").err, "PrintExtConfigSpace" + failure + "0xbad000f\n");
  EXPECT_EQ(read("2", "-e").err, "PrintExtConfigSpace" + failure + "0xbad0003\n");
  const std::string config = ReadFile(Scratch() + "/" + Folder("0000:00:03.0") + "config");
  EXPECT_EQ(read("2", "-c").out, config.substr(0, 256));
  EXPECT_EQ(read("3", "-c").out, config.substr(0, 256));
  EXPECT_EQ(read("3", "-e").out, config);
}

}  // namespace
