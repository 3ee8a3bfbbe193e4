#include <algorithm>

#include "fault/fault.h"
#include "pci_fixture.h"

namespace {

// Two segments; a bridge with a bus of its own, a slot without functions, a bus without slots, and
// modules that are found, unknown and none.
constexpr char kHost[] = R"(
list hardware_pci_seg = 0 0x100000012
list hardware_pci_seg_bus 0 = 0 2 3
list hardware_pci_seg_bus 0x100000012 = 0xff
list hardware_pci_seg_bus_slot 0 0 = 0 0x1f
list hardware_pci_seg_bus_slot 0 2 = 0 1
list hardware_pci_seg_bus_slot 0 3 =
list hardware_pci_seg_bus_slot 0x100000012 0xff = 10
list hardware_pci_seg_bus_slot_func 0 0 0 = 0
list hardware_pci_seg_bus_slot_func 0 0 0x1f = 0 7
list hardware_pci_seg_bus_slot_func 0 2 0 = 0
list hardware_pci_seg_bus_slot_func 0 2 1 =
list hardware_pci_seg_bus_slot_func 0x100000012 0xff 10 = 16
record hardware_pci_seg_bus_slot_func_pciConfigHeader 0 0 0 0 = vendorID=0x8086 deviceID=0x1 classCode=0x0600 mFlags=7 isaIrq=9 irq=9 vector=9
record hardware_pci_seg_bus_slot_func_pciConfigHeader 0 0 0x1f 0 = vendorID=0x8086 deviceID=0x2 classCode=0x0604 infoFlags=3 isaIrq=11 irq=16 vector=0x39 spawnedBus=2 mFlags=6 moduleID=7
record hardware_pci_seg_bus_slot_func_pciConfigHeader 0 0 0x1f 7 = vendorID=0x8086 deviceID=0x9 subVendorID=0xabcd subDeviceID=0xef01 classCode=0x0c03 infoFlags=1 isaIrq=11 irq=255 vector=0x39 mFlags=4 moduleID=0xffffffff
record hardware_pci_seg_bus_slot_func_pciConfigHeader 0 2 0 0 = vendorID=0x1af4 deviceID=0x1000 classCode=0x0200 infoFlags=1 isaIrq=5 irq=20 intPin=3 moduleID=9 name="vmnic0"
record hardware_pci_seg_bus_slot_func_pciConfigHeader 0x100000012 0xff 10 16 = vendorID=0xffff deviceID=0xffff classCode=0xffff infoFlags=2 spawnedBus=0xfe mFlags=8 moduleID=8 name="a name that fills its field whole"
list system_modules = 70 80 71
record system_modules_general 70 = moduleID=7 name="bridge"
record system_modules_general 71 = moduleID=7 name="later"
record system_modules_general 80 = moduleID=8 name="a module name of more than 31 characters"
)";

constexpr char kIds[] =
    "8086  Intel Corporation\n"
    "\t0001  Host bridge one\n"
    "\t0002  Port\n"
    "1af4  Red Hat, Inc.\n"
    "\t1000  Virtio network device\n"
    "ffff  Illegal Vendor ID\n"
    "C 02  Network controller\n"
    "\t00  Ethernet controller\n"
    "C 06  Bridge\n"
    "\t00  Host bridge\n"
    "\t04  PCI bridge\n"
    "\t\t00  Normal decode\n";

// One function, whose records are still to be written.
constexpr char kOneFunction[] =
    "list hardware_pci_seg = 0\n"
    "list hardware_pci_seg_bus 0 = 0\n"
    "list hardware_pci_seg_bus_slot 0 0 = 0\n"
    "list hardware_pci_seg_bus_slot_func 0 0 0 = 0\n";

std::string HeaderRecord(const std::string &instance, const std::string &parts) {
  return "record hardware_pci_seg_bus_slot_func_pciConfigHeader " + instance + " = " + parts + "\n";
}

constexpr char kDetailHeader[] =
    "Segm:Bu:De.F Vend:Dvid Subv:Subd ISA/irq/Vect P M Module       Name    \n"
    "                                 Spawned bus                           \n";

class LspciTest : public PciTest {};

TEST_F(LspciTest, Numbers) {
  const Outcome outcome = Cache(kHost, {"lspci", "-nv", "operand"});
  EXPECT_EQ(outcome.out,
            "0000:00:00.0 Class 0600: 8086:0001 \n"
            "0000:00:1f.0 Class 0604: 8086:0002 \n"
            "0000:00:1f.7 Class 0c03: 8086:0009 \n"
            "0000:02:00.0 Class 0200: 1af4:1000 [vmnic0]\n"
            "0012:ff:0a.10 Class ffff: ffff:ffff [a name that fills its field whol]\n");
  EXPECT_EQ(outcome.status, 0);
}

TEST_F(LspciTest, Details) {
  const Outcome outcome = Cache(kHost, {"lspci", "--pciinfo", "-n"});
  EXPECT_EQ(outcome.out,
            std::string(kDetailHeader) +
                "0000:00:00.0 8086:0001 0000:0000                C              \n"
                "0000:00:1f.0 8086:0002 0000:0000  11/ 16/0x39 A V bridge       \n"
                "                                  02           \n"
                "0000:00:1f.7 8086:0009 abcd:ef01  11/   /0x39 A P              \n"
                "0000:02:00.0 1af4:1000 0000:0000   5/   /     D U error        vmnic0\n"
                "0012:ff:0a.10 ffff:ffff 0000:0000                U "
                "a module name of more than 31 c a name that fills its field whol\n"
                "                                  fe           \n");
  EXPECT_EQ(outcome.err.find("List"), std::string::npos) << outcome.err;
  EXPECT_EQ(outcome.status, 0);
}

TEST_F(LspciTest, Names) {
  if (!CanMount()) GTEST_SKIP() << "cannot mount";
  Outcome outcome = WithIds({{"pci.ids", kIds}}, kHost, {"lspci"});
  EXPECT_EQ(outcome.out,
            "0000:00:00.0 Bridge: Intel Corporation Host bridge one \n"
            "0000:00:1f.0 Bridge: Intel Corporation Port \n"
            "0000:00:1f.7 :   \n"
            "0000:02:00.0 Network controller: Red Hat, Inc. Virtio network device [vmnic0]\n"
            "0012:ff:0a.10 :   [a name that fills its field whol]\n");
  EXPECT_EQ(outcome.err, "");
  EXPECT_EQ(outcome.status, 0);

  outcome = WithIds({{"pci.ids", kIds}}, kHost, {"lspci", "--verbose"});
  EXPECT_EQ(outcome.out,
            "0000:00:00.0 Host bridge Bridge: Intel Corporation Host bridge one \n"
            "\t Class 0600: 8086:0001\n\n"
            "0000:00:1f.0 PCI bridge Bridge: Intel Corporation Port \n"
            "\t Class 0604: 8086:0002\n\n"
            "0000:00:1f.7  :   \n"
            "\t Class 0c03: 8086:0009\n\n"
            "0000:02:00.0 Ethernet controller Network controller: Red Hat, Inc. Virtio network "
            "device [vmnic0]\n"
            "\t Class 0200: 1af4:1000\n\n"
            "0012:ff:0a.10  :   [a name that fills its field whol]\n"
            "\t Class ffff: ffff:ffff\n\n");
}

TEST_F(LspciTest, Dumps) {
  const std::string spaces =
      std::string(kOneFunction) + HeaderRecord("0 0 0 0", "vendorID=1") +
      "record hardware_pci_seg_bus_slot_func_pciConfigSpace 0 0 0 0 = @0:hex=00ff7f @255:u8=9\n"
      "record hardware_pci_seg_bus_slot_func_pciExtConfigSpace 0 0 0 0 = @0x100:hex=abcd\n";
  const std::string line = "0000:00:00.0 Class 0000: 0001:0000 \n";
  const std::string zeros = " 00 00 00 00 00 00 00 00 00 00 00 00 00";
  std::string standard = "00: 00 ff 7f" + zeros + "\n";
  for (const char *offset :
       {"10", "20", "30", "40", "50", "60", "70", "80", "90", "a0", "b0", "c0", "d0", "e0"}) {
    standard += offset + (": 00 00 00" + zeros) + "\n";
  }
  standard += "f0: 00 00" + zeros + " 09\n";
  EXPECT_EQ(Cache(spaces, {"lspci", "-n", "--dump"}).out, line + standard);

  const std::string extended = Cache(spaces, {"lspci", "-n", "--extdump"}).out;
  EXPECT_EQ(std::count(extended.begin(), extended.end(), '\n'), 257);
  EXPECT_TRUE(extended.starts_with(line + "00: 00 00 00" + zeros + "\n10: 00"));
  EXPECT_NE(extended.find("\nf0: 00 00 00" + zeros + "\n100: ab cd 00" + zeros + "\n"),
            std::string::npos);
  EXPECT_TRUE(extended.ends_with("\nff0: 00 00 00" + zeros + "\n"));

  EXPECT_EQ(Cache(spaces, {"lspci", "-ned"}).out, line + standard + extended.substr(line.size()));
  EXPECT_EQ(Cache(spaces, {"lspci", "-ped"}).out,
            std::string(kDetailHeader) +
                "0000:00:00.0 0001:0000 0000:0000                U              \n");
}

// What was listed stays, nothing of the failing function is shown, and what comes after it is not
// read.
TEST_F(LspciTest, FailsInTheMiddle) {
  const std::string twoFunctions =
      "list hardware_pci_seg = 0\n"
      "list hardware_pci_seg_bus 0 = 0\n"
      "list hardware_pci_seg_bus_slot 0 0 = 0\n"
      "list hardware_pci_seg_bus_slot_func 0 0 0 = 0 1 2\n" +
      HeaderRecord("0 0 0 0", "vendorID=1") + HeaderRecord("0 0 0 2", "vendorID=3") +
      "record hardware_pci_seg_bus_slot_func_pciConfigSpace 0 0 0 0 =\n";
  const std::string first = "0000:00:00.0 Class 0000: 0001:0000 \n";

  Outcome outcome =
      Live(twoFunctions + HeaderRecord("0 0 0 1", "status 0xbad000f"), {"lspci", "-n"});
  EXPECT_EQ(outcome.out, first);
  EXPECT_TRUE(outcome.err.ends_with("ListPCI: error fetching PCI information 0xbad000f\n"));
  EXPECT_EQ(outcome.status, 1);

  const std::string withHeader = twoFunctions + HeaderRecord("0 0 0 1", "vendorID=2");
  for (const char *options : {"-nd", "-nde", "-nped"}) {
    outcome = Live(withHeader +
                       "record hardware_pci_seg_bus_slot_func_pciExtConfigSpace 0 0 0 0 =\n"
                       "record hardware_pci_seg_bus_slot_func_pciConfigSpace 0 0 0 1 = status "
                       "0xbad0010\n",
                   {"lspci", options});
    EXPECT_EQ(outcome.out.find("0000:00:00.1"), std::string::npos) << outcome.out;
    EXPECT_NE(outcome.out.find("0000:00:00.0"), std::string::npos) << outcome.out;
    EXPECT_TRUE(
        outcome.err.ends_with("ListPCI: error fetching PCI configuration space 0xbad0010\n"));
    EXPECT_EQ(outcome.status, 1);
  }
}

TEST_F(LspciTest, ListFailures) {
  const struct {
    std::string host;
    std::string message;
  } cases[] = {
      {"list hardware_pci_seg = status 5\n", "seg list 0x5"},
      {"list hardware_pci_seg = 0\nlist hardware_pci_seg_bus 0 = status 6\n", "bus list 0x6"},
      {"list hardware_pci_seg = 0\nlist hardware_pci_seg_bus 0 = 1\n"
       "list hardware_pci_seg_bus_slot 0 1 = status 7\n",
       "slot list 0x7"},
      {"list hardware_pci_seg = 0\nlist hardware_pci_seg_bus 0 = 1\n"
       "list hardware_pci_seg_bus_slot 0 1 = 2\n"
       "list hardware_pci_seg_bus_slot_func 0 1 2 = status 8\n",
       "func list 0x8"},
  };
  for (const auto &[host, message] : cases) {
    const Outcome outcome = Live(host, {"lspci"});
    EXPECT_EQ(outcome.out, "");
    EXPECT_TRUE(outcome.err.ends_with("ListPCI: error fetching PCI " + message + "\n"))
        << outcome.err;
    EXPECT_EQ(outcome.status, 1);
  }
  EXPECT_EQ(Cache("list hardware_pci_seg =\n", {"lspci", "-p"}).out, kDetailHeader);
}

// The names are read for the first module that has to be named, once if that succeeds.
TEST_F(LspciTest, ModuleNames) {
  const std::string host =
      "list hardware_pci_seg = 0\n"
      "list hardware_pci_seg_bus 0 = 0\n"
      "list hardware_pci_seg_bus_slot 0 0 = 0\n"
      "list hardware_pci_seg_bus_slot_func 0 0 0 = 0 1 2\n" +
      HeaderRecord("0 0 0 0", "moduleID=0") + HeaderRecord("0 0 0 1", "moduleID=3") +
      HeaderRecord("0 0 0 2", "moduleID=4");
  const std::string start = "0000:0000 0000:0000                U ";
  const std::string error = start + "error        \n";
  const std::string failed = kDetailHeader + ("0000:00:00.0 " + start) + "             \n" +
                             "0000:00:00.1 " + error + "0000:00:00.2 " + error;

  Outcome outcome = Live(host + "list system_modules = status 9\n", {"lspci", "-p"});
  const std::string list = "ListModules: error fetching zelkernel module list - 0x9\n";
  EXPECT_TRUE(outcome.err.ends_with(list + list)) << outcome.err;
  EXPECT_EQ(outcome.out, failed);
  EXPECT_EQ(outcome.status, 0);

  outcome = Live(host +
                     "list system_modules = 1 2\n"
                     "record system_modules_general 1 = moduleID=3\n"
                     "record system_modules_general 2 = status 10\n",
                 {"lspci", "-p"});
  const std::string record = "ListModules: error fetching module info - 0xa\n";
  EXPECT_TRUE(outcome.err.ends_with(record + record)) << outcome.err;
  EXPECT_EQ(outcome.out, failed);

  // An element with the number of the end element hides those behind it.
  outcome = Live(host +
                     "list system_modules = 1 2 3\n"
                     "record system_modules_general 1 = moduleID=3 name=\"three\"\n"
                     "record system_modules_general 2 = moduleID=0xffffffff name=\"end\"\n"
                     "record system_modules_general 3 = moduleID=4 name=\"four\"\n",
                 {"lspci", "-p"});
  EXPECT_TRUE(
      outcome.out.ends_with("0000:00:00.1 " + start + "three        \n0000:00:00.2 " + error));
  EXPECT_EQ(outcome.err.find("ListModules"), std::string::npos);
}

TEST_F(LspciTest, FailedCalls) {
  const std::string host = std::string(kOneFunction) + HeaderRecord("0 0 0 0", "moduleID=3") +
                           "list system_modules = 1\n"
                           "record system_modules_general 1 = moduleID=3 name=\"three\"\n";
  const std::string start =
      kDetailHeader + std::string("0000:00:00.0 0000:0000 0000:0000") + std::string(16, ' ') + "U ";
  const std::string append = "Couldn't add param to list: 0xbad0001";
  const struct {
    const char *operation;
    int call;
    std::string message;
    bool listed;
  } cases[] = {
      {"KIF_ParamListCreate", 1, "ListPCI: Not enough memory\n", false},
      {"KIF_ParamListCreate", 2, "ListModules: Not enough memory\n", true},
      {"KIF_ParamListAddInt", 1, append, false},
      {"KIF_ParamListAddInt", 4, append, false},
      {"KIF_ParamListAddInt", 5, append + "ListModules: error requesting module info - 0x0\n",
       true},
      {"calloc", 4, "ListModules: Not enough memory\n", true},
  };
  for (const auto &[operation, call, message, listed] : cases) {
    const Outcome outcome = Live(host, {"lspci", "-p"}, Failing(operation, call));
    EXPECT_EQ(outcome.out, listed ? start + "error        \n" : kDetailHeader) << operation << call;
    EXPECT_TRUE(outcome.err.ends_with(message)) << outcome.err;
    EXPECT_EQ(outcome.status, listed ? 0 : 1) << operation << call;
  }
}

TEST_F(LspciTest, Usage) {
  const std::string usage =
      "lspci   -p --pciinfo   Print detailed info on all PCI devices\n"
      "        -n --nolookup  Don't look up PCI device names and info\n"
      "        -d --dump      Print hex dump of the standard config space\n"
      "        -e --extdump   Print hex dump of the extended config space\n"
      "        -v --verbose   Verbose information\n"
      "        -h --help      Print this help message\n";
  const std::pair<const char *, std::string> cases[] = {
      {"-h", ""},
      {"--help", ""},
      {"-x", "lspci: invalid option -- 'x'\n"},
      {"--nolookup=1", "lspci: option '--nolookup' doesn't allow an argument\n"}};
  for (const auto &[option, diagnostic] : cases) {
    const Outcome outcome = Cache(kHost, {"lspci", "-n", option});
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.err, diagnostic + usage);
    EXPECT_EQ(outcome.status, 1);
  }
}

}  // namespace
