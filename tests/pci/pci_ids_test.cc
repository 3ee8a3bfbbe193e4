// The PCI ID database, as lspci shows what it finds and says what is wrong.
#include <regex>

#include "pci_fixture.h"

namespace {

constexpr char kDevice[] = "0001  V\n\t0002  D\n";
constexpr char kClasses[] = "ffff  Illegal Vendor ID\nC 01  Storage\n\t02  Disk\n";
constexpr char kNoDevices[] = "no device entries in the pci ids files|Perhaps, corrupted file?|";
constexpr char kNoClasses[] = "no class entries in @pci.ids|Perhaps, corrupted file?|";
constexpr char kEnd[] = "Failed to build PCI tables|";

class PciIdsTest : public PciTest {
 protected:
  // The names of the class, the vendor and the device of one function, and what was said: with "|"
  // for the end of a line and "@" for the folder of the files.
  void Expect(const IdsFiles &files, const std::string &names, const std::string &messages = "") {
    const Outcome outcome = WithIds(
        files,
        "list hardware_pci_seg = 0\nlist hardware_pci_seg_bus 0 = 0\n"
        "list hardware_pci_seg_bus_slot 0 0 = 0\nlist hardware_pci_seg_bus_slot_func 0 0 0 = 0\n"
        "record hardware_pci_seg_bus_slot_func_pciConfigHeader 0 0 0 0 = vendorID=1 deviceID=2"
        " subVendorID=3 subDeviceID=4 classCode=0x0102\n",
        {"lspci", "-v"});
    const std::string said = std::regex_replace(outcome.err, std::regex("/usr/share/hwdata/"), "@");
    const std::string &published = files.count("pci.ids") > 0 ? files.at("pci.ids") : "";
    EXPECT_EQ(outcome.out.substr(0, outcome.out.find('\n')), "0000:00:00.0 " + names + " ")
        << published;
    EXPECT_EQ(std::regex_replace(said, std::regex("\n"), "|"), messages) << published;
    EXPECT_EQ(outcome.status, 0);
  }

  void ExpectDevice(const std::string &devices, const std::string &names) {
    Expect({{"pci.ids", devices + kClasses}}, "Disk Storage: " + names);
  }
  void ExpectClass(const std::string &classes, const std::string &names,
                   const std::string &messages = "") {
    Expect({{"pci.ids", kDevice + classes}}, names + ": V D", messages);
  }
  // What has `messages` and is not used.
  void ExpectNothing(const std::string &published, const std::string &messages) {
    Expect({{"pci.ids", published}}, " :  ", messages + kEnd);
  }
};

TEST_F(PciIdsTest, Malformed) {
  const std::string device = kDevice;
  const std::string classes = kClasses;
  const std::string counted = "parsing problem: devices 1 ndevid 2|";
  for (const char *line : {"0002\n", "\r\n", "00g2  W\n"}) {
    ExpectNothing(device + line + "\t0003  E\n" + classes,
                  "@pci.ids: line 3 improperly formatted(1)|" + counted);
  }
  ExpectNothing("\t0002\n\t0003  E\n" + classes,
                "@pci.ids: can't synthesize device name for line 1|"
                "parsing problem: devices 0 ndevid 2|");
  ExpectNothing(device + "\t\tx003 0004  S\n" + classes,
                "@pci.ids: line 3 improperly formatted(3)|" + counted);
  for (const std::string line : {"0003 x004  S", "0003 0004", "3 "}) {
    ExpectNothing(device + "\t\t" + line + "\n" + classes,
                  "@pci.ids: line 3 improperly formatted(4)|" + counted);
  }
  ExpectNothing("\t\t0003 0004  S\n" + classes,
                "no vendor information for subvendor 00003: subsystem 00004"
                "parsing problem: devices 0 ndevid 1|");
  // Behind the last device a malformed line is said, and the classes are read all the same.
  Expect({{"pci.ids", device + "0002\n" + classes}}, "Disk Storage: V D",
         "@pci.ids: line 3 improperly formatted(1)|");
  ExpectNothing(device + "0002\nC7  no class yet\nffff  x\n\t\t01  P\n\t02  S\nC\n\t01  T\n",
                "@pci.ids: line 3 improperly formatted(1)|@pci.ids: line 8 improperly formatted(5)|"
                "internal error: classes 2 nclass 3|");
  // The vendor stays in force across files, line numbers do not.
  Expect({{"oem.pciids.d/x.ids", "0001 V\n#\n"}, {"pci.ids", "\t0002  D\n0\n\t0003  E\n"}}, " :  ",
         kNoClasses + std::string("@pci.ids: line 2 improperly formatted(1)|") + counted + kEnd);
  Expect({{"driver.pciids.d/x.ids", "#\n\t9\n"}, {"pci.ids", classes}}, " :  ",
         "@driver.pciids.d/x.ids: can't synthesize device name for line 2|"
         "parsing problem: devices 0 ndevid 1|" +
             std::string(kEnd));
}

TEST_F(PciIdsTest, Devices) {
  ExpectDevice(" 0001  no vendor line\n#\n\t\t\tdeep\n0001 \t V \n\t 2\t\tD  e \n", "V  D  e ");
  ExpectDevice("F0001 V\n\t7fff0002 D\r\n", "V D\r");
  ExpectDevice("0001 V\n\t0002 \n", "V Name not available for V device");
  ExpectDevice("0001 V\n\t0002 \n\t0002  D\n\t0002  E\n", "V D");
  ExpectDevice("0001 V\n\t0002  D\n0003  W\n\t0002  E\n0001  X\n\t\t0003 0004  S\n", "X S");
  ExpectDevice("0001 V\n\t0002  D\n\t\t0003 0005  S\n\t\t0005 0004  T\n\t\t10003 0004  U\n", "V U");
  ExpectDevice("0009 V\n\t0002  D\n0001  W\n\t\t0003 0004  S\n\t\t0003 0004  T\n", "W S");
  // No subsystem at all, so a device.
  ExpectDevice("0001 V\n\t0002 \n\t\t0000 0004  S\n", "V S");
  // The number is the one above.
  ExpectDevice("0001 V\n\t0002 \n\t0003  E\n\tz\n\t\t0003 0004  F\n",
               "V Name not available for V device");
  ExpectDevice(std::string("0001 V\0W\n\t0002 D\0E\n", 19), "V D");
  ExpectDevice("0001 " + std::string(70, 'v') + "\n\t0002 " + std::string(140, 'd') + "\n",
               std::string(63, 'v') + " " + std::string(127, 'd'));
  // A read takes 255 bytes; what is left of a line is a line of its own.
  ExpectDevice("0001 V\n#" + std::string(254, 'x') + "\t0002 D\n", "V D");
  ExpectDevice("0001 V\n#" + std::string(253, 'x') + "\n\t0002 D\n", "V D");
}

TEST_F(PciIdsTest, Classes) {
  const std::string end = "ffff\n";
  ExpectClass("", " ", kNoClasses);
  Expect({{"pci.ids", kClasses}}, "Disk Storage:  ", kNoDevices);
  Expect({}, " :  ", std::string(kNoDevices) + kNoClasses);
  ExpectClass(end + "C 101  Storage\n# comment\n\tf02  Disk\n\t02  Again\n\n\t\t05  Fast\nother\n",
              "Disk Storage");
  ExpectClass(end + "C 00  Old\n\t02  Disk\nC 01  Storage\n\t\t00  Fast\n\t\t06  Slow",
              "Disk Storage");
  ExpectClass(end + "C 01  " + std::string(70, 's') + "\n\t02  " + std::string(70, 'd') + "\n",
              std::string(63, 'd') + " " + std::string(63, 's'));
  // What could be read of a malformed last line counts.
  ExpectClass(end + "C 01  Storage\n\t03  Tape\n\t02\t\n", "Tape Storage",
              "@pci.ids: line 6 improperly formatted(6)|");
  ExpectClass(end + "C 01  Storage\n\t02  Disk\nC 0x\n", "Disk Storage",
              "@pci.ids: line 6 improperly formatted(5)|");
  ExpectClass(end + "C 01  Storage\n\t02  Disk\n\t\t03\n", "Disk Storage",
              "@pci.ids: line 6 improperly formatted(7)|");
  for (const auto &[line, number] :
       {std::pair("C 03", "(5)|internal error: classes 1 nclass 2|"),
        std::pair("\t03", "(6)|internal error: classes 2 nclass 3|"),
        std::pair("\t\t3", "(7)|internal error: classes 1 nclass 2|")}) {
    ExpectNothing(kDevice + end + "C 01  Storage\n\t02  Disk\n" + line + "\n\t04  x\n",
                  "@pci.ids: line 6 improperly formatted" + std::string(number));
  }
}

TEST_F(PciIdsTest, OverridesAgainstEachOtherAndThePublishedFile) {
  const auto device = [](const std::string &name) {
    return "0001  " + name + "\n\t0002  " + name + " device\n";
  };
  const std::string subsystem = "\t\t0003 0004  subsystem\n";
  IdsFiles files = {{"pci.ids", device("published") + subsystem + kClasses}};
  for (const std::string directory : {"fallback", "driver", "default", "ihv", "oem"}) {
    files[directory + ".pciids.d/a.ids"] = device(directory);
    Expect(files, "Disk Storage: " + directory + " " + directory + " device");
  }
  // A made-up name gives way, and does not hide a published subsystem.
  files["oem.pciids.d/a.ids"] = "0001  oem\n\t0002 \n";
  Expect(files, "Disk Storage: ihv ihv device");
  files["fallback.pciids.d/a.ids"] = device("fallback") + subsystem;
  Expect(files, "Disk Storage: fallback subsystem");
  for (const std::string name : {"", "Name not available for you"}) {
    Expect({{"oem.pciids.d/a.ids", "0001  oem\n\t0002  " + name + "\n"},
            {"pci.ids", device("published") + kClasses}},
           "Disk Storage: published published device");
  }
  // An override file that ends the device section makes all that follows classes.
  Expect({{"oem.pciids.d/a.ids", device("oem") + "ffff\n"}, {"pci.ids", "C 01 c\n\t02 s\n"}},
         "s c: oem oem device");
}

TEST_F(PciIdsTest, FilesOfADirectory) {
  for (const std::string name : {".ids", "x.IDS", "xids", "x.ids/file"}) {
    Expect({{"oem.pciids.d/" + name, kDevice}, {"pci.ids", kClasses}},
           "Disk Storage:  ", kNoDevices);
  }
  Expect({{"oem.pciids.d", "a file"}, {"pci.ids", kClasses}}, "Disk Storage:  ", kNoDevices);
  // 255 characters are the most that a path may have.
  const std::string longest = std::string(220, 'x') + ".ids";
  Expect({{"oem.pciids.d/" + longest, kDevice}, {"pci.ids", kClasses}}, "Disk Storage: V D");
  const Outcome outcome = WithIds({{"oem.pciids.d/x" + longest, ""}}, "", {"lspci", "-p"});
  EXPECT_EQ(outcome.out, "");
  EXPECT_EQ(outcome.err, "Found corrupted file name\n");
  EXPECT_EQ(outcome.status, 1);
}

}  // namespace
