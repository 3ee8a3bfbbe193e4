// The PCI ID database, as lspci shows what it finds and says what is wrong.
#include <regex>
#include <sstream>

#include <map>

#include "host_fixture.h"

namespace {

std::string Replaced(const std::string &text, const std::string &what, const std::string &by) {
  return std::regex_replace(text, std::regex(what), by);
}

// Paths below the folder of the PCI ID files, and what is in the files.
using IdsFiles = std::map<std::string, std::string>;

class PciIdsTest : public HostTest {
 protected:
  // A run of lspci with these and no other PCI ID files.
  Outcome WithIds(const IdsFiles &files, const std::string &hostText, const char *option) {
    const std::string folder = Scratch() + "/hwdata";
    Run({"rm", "-rf", folder});
    for (const auto &[path, bytes] : files) WriteFile("hwdata/" + path, bytes);
    return Run({BIN_DIR "/zlkkiftools", "-c", Record(hostText), "lspci", option},
               {.environment = {"HWDATA_FOLDER=" + folder}, .preloaded = {HWDATA_FOLDER}});
  }

  // What is shown of one function, and what was said: with "|" for the end of a line and "@" for
  // the folder of the files.
  void Expect(const IdsFiles &files, const std::string &expected) {
    const Outcome outcome = WithIds(
        files,
        "list hardware_pci_seg = 0\nlist hardware_pci_seg_bus 0 = 0\n"
        "list hardware_pci_seg_bus_slot 0 0 = 0\nlist hardware_pci_seg_bus_slot_func 0 0 0 = 0\n"
        "record hardware_pci_seg_bus_slot_func_pciConfigHeader 0 0 0 0 = vendorID=1 deviceID=2"
        " subVendorID=3 subDeviceID=4 classCode=0x0102\n",
        "-v");
    const std::string names = outcome.out.substr(13, outcome.out.find('\n') - 13);
    const std::string said = Replaced(Replaced(outcome.err, "/usr/share/hwdata/", "@"), "\n", "|");
    EXPECT_EQ(names + said, expected) << testing::PrintToString(files);
    EXPECT_EQ(outcome.status, 0);
  }

  // A case a line, of what is in the files and what is expected. Each file but the only one begins
  // with "[NAME]"; \n, \t, \r and \0 are bytes; DEVICE and CLASS are what a file needs at least.
  void ExpectEach(const std::string &cases) {
    std::istringstream lines(cases);
    for (std::string line; std::getline(lines, line);) {
      const size_t arrow = line.find(" -> ");
      std::string text = line.substr(0, arrow);
      text = Replaced(text, "DEVICE", "0001  V\\n\\t0002  D\\n");
      text = Replaced(text, "CLASS", "ffff  Illegal\\nC 01  Storage\\n\\t02  Disk\\n");
      text = Replaced(Replaced(text, "\\\\n", "\n"), "\\\\t", "\t");
      text = Replaced(Replaced(text, "\\\\r", "\r"), "\\\\0", std::string(1, '\0'));
      IdsFiles files;
      if (!text.starts_with('[')) files["pci.ids"] = text;
      for (size_t at = 0; at < text.size() && text[at] == '[';) {
        const size_t end = text.find(']', at), next = text.find('[', end);
        files[text.substr(at + 1, end - at - 1)] = text.substr(end + 1, next - end - 1);
        at = next;
      }
      Expect(files, line.substr(arrow + 4));
    }
  }
};

TEST_F(PciIdsTest, Devices) {
  ExpectEach(
      R"( 0001  no vendor line\n#\n\t\t\tdeep\n0001 \t V \n\t 2\t\tD  e \nCLASS -> Disk Storage: V  D  e  
F0001 V\n\t7fff0002 \nCLASS -> Disk Storage: V Name not available for V device 
0001 V\n\t0002 \n\t0002  D\n\t0002  E\nCLASS -> Disk Storage: V D 
DEVICE0003  W\n\t0002  E\n0001  X\n\t\t0003 0004  S\nCLASS -> Disk Storage: X S 
DEVICE\t\t0003 0005  S\n\t\t0005 0004  T\n\t\t10003 0004  U\nCLASS -> Disk Storage: V U 
0009 V\n\t0002  D\n0001  W\n\t\t0003 0004  S\n\t\t0003 0004  T\nCLASS -> Disk Storage: W S 
0001 V\n\t0002 \n\t\t0000 0004  S\nCLASS -> Disk Storage: V S 
0001 V\n\t0002 \n\t0003  E\n\tz\n\t\t0003 0004  F\nCLASS -> Disk Storage: V Name not available for V device 
0001 V\0W\n\t0002 \0E\nCLASS -> Disk Storage: V Name not available for V device 
DEVICE0002\n\t0003  E\nCLASS ->  :   @pci.ids: line 3 improperly formatted(1)|parsing problem: devices 1 ndevid 2|Failed to build PCI tables|
DEVICE00g2  W\n\t0003  E\nCLASS ->  :   @pci.ids: line 3 improperly formatted(1)|parsing problem: devices 1 ndevid 2|Failed to build PCI tables|
\t0002\n\t0003  E\nCLASS ->  :   @pci.ids: can't synthesize device name for line 1|parsing problem: devices 0 ndevid 2|Failed to build PCI tables|
DEVICE\t\tx003 0004  S\nCLASS ->  :   @pci.ids: line 3 improperly formatted(3)|parsing problem: devices 1 ndevid 2|Failed to build PCI tables|
DEVICE\t\t3 \nCLASS ->  :   @pci.ids: line 3 improperly formatted(4)|parsing problem: devices 1 ndevid 2|Failed to build PCI tables|
\t\t0003 0004  S\nCLASS ->  :   no vendor information for subvendor 00003: subsystem 00004parsing problem: devices 0 ndevid 1|Failed to build PCI tables|
)");
  const std::string end = "\nffff\nC 01  Storage\n\t02  Disk\n";
  Expect({{"pci.ids", "0001 " + std::string(70, 'v') + "\n\t0002 " + std::string(140, 'd') + end}},
         "Disk Storage: " + std::string(63, 'v') + " " + std::string(127, 'd') + " ");
  // A read takes 255 bytes; what is left of a line is a line of its own.
  for (const std::string &comment : {std::string(254, 'x'), std::string(253, 'x') + "\n"}) {
    Expect({{"pci.ids", "0001 V\n#" + comment + "\t0002 D" + end}}, "Disk Storage: V D ");
  }
}

// What could be read of a malformed last line counts, and behind the last device it does no harm.
TEST_F(PciIdsTest, Classes) {
  ExpectEach(
      R"( ->  :   no device entries in the pci ids files|Perhaps, corrupted file?|no class entries in @pci.ids|Perhaps, corrupted file?|
CLASS -> Disk Storage:   no device entries in the pci ids files|Perhaps, corrupted file?|
DEVICE ->  : V D no class entries in @pci.ids|Perhaps, corrupted file?|
DEVICE0002\nCLASS -> Disk Storage: V D @pci.ids: line 3 improperly formatted(1)|
DEVICE0002\nC7  no class yet\nffff  x\n\t\t01  P\n\t02  S\nC\n\t01  T\n ->  :   @pci.ids: line 3 improperly formatted(1)|@pci.ids: line 8 improperly formatted(5)|internal error: classes 2 nclass 3|Failed to build PCI tables|
DEVICEffff\nC 101  Storage\n# comment\n\tf02  Disk\n\t02  Again\n\n\t\t05  Fast\nother\n -> Disk Storage: V D 
DEVICEffff\nC 00  Old\n\t02  Disk\nC 01  Storage\n\t\t00  Fast\n\t\t06  Slow -> Disk Storage: V D 
DEVICEffff\nC 01  Storage\n\t03  Tape\n\t02\t\n -> Tape Storage: V D @pci.ids: line 6 improperly formatted(6)|
DEVICECLASSC 0x\n -> Disk Storage: V D @pci.ids: line 6 improperly formatted(5)|
DEVICECLASS\t\t03\n -> Disk Storage: V D @pci.ids: line 6 improperly formatted(7)|
DEVICECLASSC 03\n\t04  x\n ->  :   @pci.ids: line 6 improperly formatted(5)|internal error: classes 1 nclass 2|Failed to build PCI tables|
DEVICECLASS\t03\n\t04  x\n ->  :   @pci.ids: line 6 improperly formatted(6)|internal error: classes 2 nclass 3|Failed to build PCI tables|
DEVICECLASS\t\t3\n\t04  x\n ->  :   @pci.ids: line 6 improperly formatted(7)|internal error: classes 1 nclass 2|Failed to build PCI tables|
)");
  const std::string long70(70, 's'), long63(63, 's');
  Expect({{"pci.ids", "1 V\n\t2 D\nffff\nC 01  " + long70 + "\n\t02  " + long70 + "\n"}},
         long63 + " " + long63 + ": V D ");
}

// The made-up name of an override gives way, and does not hide a published subsystem. The vendor
// stays in force across files; behind an override file that ends the device section all is classes.
TEST_F(PciIdsTest, Overrides) {
  IdsFiles files = {{"pci.ids", "1 p\n\t2 p\n\t\t0003 0004  s\nffff\nC 01 c\n\t02 s\n"}};
  for (const std::string directory : {"fallback", "driver", "default", "ihv", "oem"}) {
    files[directory + ".pciids.d/a.ids"] = "1 " + directory + "\n\t2 " + directory + "\n";
    Expect(files, "s c: " + directory + " " + directory + " ");
  }
  ExpectEach(
      R"([ihv.pciids.d/a.ids]1 i\n\t2 i\n[oem.pciids.d/a.ids]1 o\n\t2 \n[pci.ids]DEVICECLASS -> Disk Storage: i i 
[ihv.pciids.d/a.ids]1 i\n\t2 i\n\t\t0003 0004  s\n[oem.pciids.d/a.ids]1 o\n\t2 o\n[pci.ids]DEVICECLASS -> Disk Storage: i s 
[oem.pciids.d/a.ids]1 o\n\t2 \n[pci.ids]DEVICE\t\t0003 0004  S\nCLASS -> Disk Storage: V S 
[oem.pciids.d/a.ids]1 o\n\t2 Name not available for you\n[pci.ids]DEVICECLASS -> Disk Storage: V D 
[oem.pciids.d/a.ids]1 o\n\t2 o\nffff\n[pci.ids]C 00 c\nC 01 d\n\t02 s\n -> s d: o o 
[oem.pciids.d/x.ids]0001 V\n#\n[pci.ids]\t0002  D\n0\n\t0003  E\nCLASS ->  :   @pci.ids: line 2 improperly formatted(1)|parsing problem: devices 1 ndevid 2|Failed to build PCI tables|
[driver.pciids.d/x.ids]#\n\t9\n[pci.ids]CLASS ->  :   @driver.pciids.d/x.ids: can't synthesize device name for line 2|parsing problem: devices 0 ndevid 1|Failed to build PCI tables|
[oem.pciids.d/.ids]1 o\n\t2 o\n[pci.ids]DEVICECLASS -> Disk Storage: V D 
[oem.pciids.d/x.IDS]1 o\n\t2 o\n[pci.ids]DEVICECLASS -> Disk Storage: V D 
[oem.pciids.d/x.ids/file]1 o\n\t2 o\n[pci.ids]DEVICECLASS -> Disk Storage: V D 
[oem.pciids.d]1 o\n\t2 o\n[pci.ids]DEVICECLASS -> Disk Storage: V D 
)");
  // 255 characters are the most that a path may have.
  const std::string longest = std::string(220, 'x') + ".ids";
  Expect({{"oem.pciids.d/" + longest, "1 V\n\t2 D\n"}, {"pci.ids", "ffff\nC 01 c\n\t02 s\n"}},
         "s c: V D ");
  const Outcome outcome = WithIds({{"oem.pciids.d/x" + longest, ""}}, "", "-p");
  EXPECT_EQ(outcome.out, "");
  EXPECT_EQ(outcome.err, "Found corrupted file name\n");
  EXPECT_EQ(outcome.status, 1);
}

}  // namespace
