// The PCI ID database, as lspci shows what it finds and says what is wrong.
#include "pci_fixture.h"

namespace {

constexpr char kPublished[] = "/usr/share/hwdata/pci.ids";
constexpr char kFailed[] = "Failed to build PCI tables\n";
constexpr char kNoDevices[] = "no device entries in the pci ids files\nPerhaps, corrupted file?\n";
constexpr char kNoClasses[] =
    "no class entries in /usr/share/hwdata/pci.ids\nPerhaps, corrupted file?\n";
constexpr char kEnd[] = "ffff  Illegal Vendor ID\n";
constexpr char kClasses[] = "ffff  Illegal Vendor ID\nC 01  Storage\n\t02  Disk\n";

class PciIdsTest : public PciTest {
 protected:
  void SetUp() override {
    if (!CanMount()) GTEST_SKIP() << "cannot mount";
  }

  // What lspci prints of a function after its address, up to the end of the line.
  std::string Shown(const IdsFiles &files, const std::string &header, const char *options = "--") {
    messages_ = "";
    const Outcome outcome = WithIds(files,
                                    "list hardware_pci_seg = 0\n"
                                    "list hardware_pci_seg_bus 0 = 0\n"
                                    "list hardware_pci_seg_bus_slot 0 0 = 0\n"
                                    "list hardware_pci_seg_bus_slot_func 0 0 0 = 0\n"
                                    "record hardware_pci_seg_bus_slot_func_pciConfigHeader "
                                    "0 0 0 0 = " +
                                        header + "\n",
                                    {"lspci", options});
    EXPECT_EQ(outcome.status, 0) << outcome.err;
    messages_ = outcome.err;
    const std::string line = outcome.out.substr(0, outcome.out.find('\n'));
    const std::string address = "0000:00:00.0 ";
    return line.starts_with(address) ? line.substr(address.size()) : line;
  }

  // Vendor and device name of the device 1:2 or its subsystem 3:4.
  std::string Device(const IdsFiles &files) {
    const std::string shown = Shown(files, "vendorID=1 deviceID=2 subVendorID=3 subDeviceID=4");
    EXPECT_EQ(shown.substr(0, 2), ": ");
    return shown.substr(2);
  }

  std::string Messages(const IdsFiles &files) {
    Shown(files, "");
    return messages_;
  }

  std::string messages_;
};

TEST_F(PciIdsTest, Messages) {
  const auto malformed = [](int line, int number) {
    return std::string(kPublished) + ": line " + std::to_string(line) + " improperly formatted(" +
           std::to_string(number) + ")\n";
  };
  const std::string two = std::string("parsing problem: devices 1 ndevid 2\n") + kFailed;
  const std::string device = "0001  V\n\t0002  D\n";
  const struct {
    std::string published;
    std::string messages;
  } cases[] = {
      {device + kClasses, ""},
      {"", std::string(kNoDevices) + kNoClasses},
      {device, kNoClasses},
      {std::string("# only classes\n \n\n\t\t\tdeep\n") + kClasses, kNoDevices},
      // The device section.
      {device + "0002\n\t0003  E\n" + kClasses, malformed(3, 1) + two},
      {device + "\r\n\t0003  E\n" + kClasses, malformed(3, 1) + two},
      {device + "00g2  W\n\t0003  E\n" + kClasses, malformed(3, 1) + two},
      {std::string("\t0002\n\t0003  E\n") + kClasses,
       std::string(kPublished) + ": can't synthesize device name for line 1\n" +
           "parsing problem: devices 0 ndevid 2\n" + kFailed},
      {device + "\t\tx003 0004  S\n" + kClasses, malformed(3, 3) + two},
      {device + "\t\t0003 x004  S\n" + kClasses, malformed(3, 4) + two},
      {device + "\t\t0003 0004\n" + kClasses, malformed(3, 4) + two},
      {device + "\t\t3 \n" + kClasses, malformed(3, 4) + two},
      {device +
           std::string("\t\t3 \0\0"
                       "005 S\n",
                       12) +
           kClasses,
       malformed(3, 4) + two},
      {std::string("\t\t0003 0004  S\n") + kClasses,
       std::string("no vendor information for subvendor 00003: subsystem 00004") +
           "parsing problem: devices 0 ndevid 1\n" + kFailed},
      // A malformed line below the last device is said, and the classes are read all the same.
      {device + "0002\n" + kClasses, malformed(3, 1)},
      {device + "0002\nC7  no class yet\n\t08  nor a subclass\n" + kClasses,
       malformed(3, 1) + "parsing problem: devices 1 ndevid 2\n" + kFailed},
      {device + "0002\nC7  no class yet\n" + kEnd + "\t\t01  P\n\t02  S\nC\n\t01  T\n",
       malformed(3, 1) + malformed(8, 5) + "internal error: classes 2 nclass 3\n" + kFailed},
      // The class section.
      {device + kClasses + "C 0x\n", malformed(6, 5)},
      {device + kClasses + "C 03\n\t01  x\n",
       malformed(6, 5) + "internal error: classes 1 nclass 2\n" + kFailed},
      {device + kClasses + "\t03\n", malformed(6, 6)},
      {device + kClasses + "\t03\n\t04  x\n",
       malformed(6, 6) + "internal error: classes 2 nclass 3\n" + kFailed},
      {device + kClasses + "\t\t03\n", malformed(6, 7)},
      {device + kClasses + "\t\t\tx\n\t04  x\n",
       malformed(6, 7) + "internal error: classes 1 nclass 2\n" + kFailed},
  };
  for (const auto &[published, messages] : cases) {
    EXPECT_EQ(Messages({{"pci.ids", published}}), messages) << published;
  }
}

TEST_F(PciIdsTest, PathsAndLinesOfOverridesInMessages) {
  EXPECT_EQ(Messages({{"driver.pciids.d/x.ids", "#\n\t9\n"}, {"pci.ids", kClasses}}),
            std::string("/usr/share/hwdata/driver.pciids.d/x.ids: can't synthesize device name for "
                        "line 2\nparsing problem: devices 0 ndevid 1\n") +
                kFailed);
  // The vendor stays in force across files, line numbers do not.
  EXPECT_EQ(
      Messages({{"oem.pciids.d/x.ids", "0001 V\n#\n"}, {"pci.ids", "\t0002  D\n0\n\t0003  E\n"}}),
      std::string(kNoClasses) + kPublished + ": line 2 improperly formatted(1)\n" +
          "parsing problem: devices 1 ndevid 2\n" + kFailed);
}

TEST_F(PciIdsTest, DeviceNames) {
  const std::string classes = kClasses;
  const struct {
    std::string published;
    std::string shown;
  } cases[] = {
      {"0001  V\n\t0002  D\n", "V D "},
      {" 0001  not a vendor line\n0001 \t V \n\t 2\t\tD  e \n", "V  D  e  "},
      {"F0001 V\n\t7fff0002 D\r\n", "V D\r "},
      {"0001 V\n\t0002 \n", "V Name not available for V device "},
      {"0001 V\n\t0002 \n\t0002  D\n", "V D "},
      {"0001 V\n\t0002  D\n\t0002  E\n", "V D "},
      {"0001 V\n\t0002  D\n0003  W\n\t0002  E\n0001  X\n\t0002  F\n\t\t0003 0004  S\n", "X S "},
      {"0001 V\n\t0002  D\n\t\t0003 0004  S\n\t\t0003 0004  T\n", "V S "},
      {"0001 V\n\t0002  D\n\t\t0003 0005  S\n\t\t0005 0004  T\n", "V D "},
      {"0001 V\n\t0002  D\n\t\t10003 0004  S\n", "V S "},
      {"0001 V\n\t0002  D\n\t\t003 00004  S\n", "V S "},
      {"0001 V\n\t\t0003 0004  S\n", "  "},
      {"0009 V\n\t0002  D\n0001  W\n\t\t0003 0004  S\n", "W S "},
      // No subsystem at all, so a device.
      {"0001 V\n\t0002 \n\t\t0000 0004  S\n", "V S "},
      // The number is the one above.
      {"0001 V\n\t0002 \n\t0003  E\n\tz\n\t\t0003 0004  F\n", "V Name not available for V device "},
      {"0001 V\n\t0002  D\n\tz\n\t\t0003 0004  S\n", "V S "},
      {std::string("0001 V\0W\n\t0002 D\0E\n", 19), "V D "},
      {"0001 " + std::string(70, 'v') + "\n\t0002 " + std::string(140, 'd') + "\n",
       std::string(63, 'v') + " " + std::string(127, 'd') + " "},
  };
  for (const auto &[published, shown] : cases) {
    EXPECT_EQ(Device({{"pci.ids", published + classes}}), shown) << published;
    EXPECT_EQ(messages_, "") << published;
  }
}

// A read takes 255 bytes; what is left of a line is a line of its own.
TEST_F(PciIdsTest, LongLines) {
  const std::string start = "0001 V\n#";
  EXPECT_EQ(Device({{"pci.ids", start + std::string(254, 'x') + "\t0002 D\n" + kClasses}}), "V D ");
  EXPECT_EQ(Device({{"pci.ids", start + std::string(253, 'x') + "\n\t0002 D\n" + kClasses}}),
            "V D ");
  EXPECT_EQ(messages_, "");
  EXPECT_EQ(Messages({{"pci.ids", start + std::string(510, 'x') + "\n" + kClasses}}),
            std::string(kNoDevices) + kPublished + ": line 3 improperly formatted(1)\n");
}

TEST_F(PciIdsTest, Classes) {
  const std::string device = "0001  V\n\t0002  D\n";
  const struct {
    std::string classes;
    std::string shown;
  } cases[] = {
      {"C 01  Storage\n\t02  Disk\n", "Disk Storage: "},
      {"C 01  Storage\n# comment\n\t02  Disk\n\n\t\t05  Fast\nother\n\t\t06  Slow\n",
       "Disk Storage: "},
      {"C 01  Storage\n\t02  Disk\n\t02  Again\n", "Disk Storage: "},
      {"C 101  Storage\n\tf02  Disk\n", "Disk Storage: "},
      {"ffff\nC 01  Storage\n\t02  Disk", "Disk Storage: "},
      {"C 00  Old\n\t02  Disk\nC 01  Storage\n\t\t00  Fast\n", "Disk Storage: "},
      {"C 01  Storage\n\t03  Tape\n", " : "},
      // What could be read of a malformed last line counts.
      {"C 01  Storage\n\t03  Tape\n\t02\t\n", "Tape Storage: "},
      {"C 01  " + std::string(70, 's') + "\n\t02  " + std::string(70, 'd') + "\n",
       std::string(63, 'd') + " " + std::string(63, 's') + ": "},
  };
  for (const auto &[classes, shown] : cases) {
    EXPECT_EQ(Shown({{"pci.ids", device + kEnd + classes}}, "classCode=0x0102", "-v"), shown + "  ")
        << classes;
  }
}

TEST_F(PciIdsTest, OverridesAgainstEachOtherAndThePublishedFile) {
  const auto device = [](const char *name) {
    return std::string("0001  ") + name + "\n\t0002  " + name + " device\n";
  };
  const std::string subsystem = "\t\t0003 0004  subsystem\n";
  IdsFiles files = {{"pci.ids", device("published") + subsystem + kClasses}};
  EXPECT_EQ(Device(files), "published subsystem ");
  for (const char *directory : {"fallback", "driver", "default", "ihv", "oem"}) {
    files[std::string(directory) + ".pciids.d/a.ids"] = device(directory);
    EXPECT_EQ(Device(files), directory + (std::string(" ") + directory) + " device ");
  }
  // A made-up name gives way, and does not hide a published subsystem.
  files["oem.pciids.d/a.ids"] = "0001  oem\n\t0002 \n";
  EXPECT_EQ(Device(files), "ihv ihv device ");
  EXPECT_EQ(Device({{"oem.pciids.d/a.ids", "0001  oem\n\t0002 \n"},
                    {"pci.ids", device("published") + subsystem + kClasses}}),
            "published subsystem ");
  EXPECT_EQ(Device({{"oem.pciids.d/a.ids", "0001  oem\n\t0002  Name not available for you\n"},
                    {"pci.ids", device("published") + kClasses}}),
            "published published device ");
  files["fallback.pciids.d/a.ids"] = device("fallback") + subsystem;
  EXPECT_EQ(Device(files), "fallback subsystem ");
  // An override file that ends the device section makes all that follows classes.
  EXPECT_EQ(Device({{"oem.pciids.d/a.ids", device("oem") + kEnd}, {"pci.ids", "C 00 c\n\t01 s\n"}}),
            "oem oem device ");
  EXPECT_EQ(messages_, "");
}

TEST_F(PciIdsTest, FilesOfADirectory) {
  const std::string device = "0001  V\n\t0002  D\n";
  for (const char *name : {".ids", "x.IDS", "x.ids~", "xids"}) {
    EXPECT_EQ(Device({{std::string("oem.pciids.d/") + name, device}, {"pci.ids", kClasses}}), "  ")
        << name;
  }
  EXPECT_EQ(Device({{"oem.pciids.d/x.ids", device}, {"pci.ids", kClasses}}), "V D ");
  EXPECT_EQ(Device({{"oem.pciids.d/x.ids/file", device}, {"pci.ids", device + kClasses}}), "V D ");
  EXPECT_EQ(Device({{"oem.pciids.d", "a file"}, {"pci.ids", device + kClasses}}), "V D ");

  // 255 characters are the most that a path may have.
  const std::string folder = "/usr/share/hwdata/oem.pciids.d/";
  const std::string longest = std::string(255 - folder.size() - 4, 'x') + ".ids";
  EXPECT_EQ(Device({{"oem.pciids.d/" + longest, device}, {"pci.ids", kClasses}}), "V D ");
  const Outcome outcome =
      WithIds({{"oem.pciids.d/x" + longest, device}}, "list hardware_pci_seg =\n", {"lspci", "-p"});
  EXPECT_EQ(outcome.out, "");
  EXPECT_EQ(outcome.err, "Found corrupted file name\n");
  EXPECT_EQ(outcome.status, 1);
}

TEST_F(PciIdsTest, MissingFiles) {
  EXPECT_EQ(Device({}), "  ");
  EXPECT_EQ(messages_, std::string(kNoDevices) + kNoClasses);
}

TEST_F(PciIdsTest, WithoutMemoryForTheTables) {
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
  GTEST_SKIP() << "the sanitizer needs the address space";
#endif
  std::string published = "0001  V\n";
  for (int i = 0; i < 10'000'000; ++i) published += "\t\n";
  published += kEnd;
  for (int i = 0; i < 1'000'000; ++i) published += "\t1\n";
  const Outcome outcome =
      WithIds({{"pci.ids", published}}, "list hardware_pci_seg =\n", {"lspci"}, "ulimit -v 120000");
  EXPECT_EQ(outcome.err, std::string("couldn't allocate PciDevTable (2000000000 bytes)\n"
                                     "couldn't allocate PciClassCodeTable (195000000 bytes)\n") +
                             kFailed);
  EXPECT_EQ(outcome.status, 0);
}

}  // namespace
