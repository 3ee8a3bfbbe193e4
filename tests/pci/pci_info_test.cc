#include "fault/fault.h"
#include "host_fixture.h"

namespace {

constexpr char kHost[] = R"(
list hardware_pci_seg = 0 0x100000003
list hardware_pci_seg_bus 0 = 1
list hardware_pci_seg_bus 0x100000003 = 1
list hardware_pci_seg_bus_slot 0 1 = 2
list hardware_pci_seg_bus_slot 0x100000003 1 = 2
list hardware_pci_seg_bus_slot_func 0 1 2 = 0 3
list hardware_pci_seg_bus_slot_func 0x100000003 1 2 = 0
record hardware_pci_seg_bus_slot_func_pciConfigHeader 0 1 2 3 = irq=5 physSlot=12
record hardware_pci_seg_bus_slot_func_pciConfigSpace 0 1 2 3 = @0:hex=0a0d00ff @255:u8=0x1b
record hardware_pci_seg_bus_slot_func_pciExtConfigSpace 0 1 2 3 = @4095:u8=7
record hardware_pci_seg_bus_slot_func_pciConfigHeader 0x100000003 1 2 0 = irq=255 physSlot=-1
)";

class PciInfoTest : public HostTest {};

TEST_F(PciInfoTest, Numbers) {
  Outcome outcome = Cache(kHost, {"pci-info", "-b1", "-s", "2", "-f3", "-Si"});
  EXPECT_EQ(outcome.out, "  5 12");
  EXPECT_EQ(outcome.err, "");
  EXPECT_EQ(outcome.status, 0);
  // The segment is compared by its low 32 bits and passed on as the host gave it.
  outcome = Cache(kHost, {"pci-info", "-n3", "-b1x", "-s7", "-s2", "-f", "z", "-i", "-S"});
  EXPECT_EQ(outcome.out, "255 -1");
  EXPECT_EQ(Cache(kHost, {"pci-info", "-n0x3", "-b1", "-s2", "-f3", "-i"}).out, "  5");
}

TEST_F(PciInfoTest, DumpsComeBeforeNumbers) {
  std::string space(256, '\0');
  space.replace(0, 4, "\x0a\x0d\x00\xff", 4);
  space[255] = '\x1b';
  std::string extended(4096, '\0');
  extended[4095] = '\x07';
  const Outcome outcome = Cache(kHost, {"pci-info", "-b1", "-s2", "-f3", "-S", "-e", "-c", "-i"});
  EXPECT_EQ(outcome.out, space + extended + "  5 12");
  EXPECT_EQ(outcome.status, 0);
}

TEST_F(PciInfoTest, InvalidDevices) {
  const struct {
    std::vector<std::string> arguments;
    std::string messages;
  } cases[] = {
      {{"-i"}, "GetDevice: invalid bus -1\nGetPCIInfo: invalid device: -1:-1.-1\n"},
      {{"-n1", "-b1", "-S"}, "GetDevice: invalid seg 1\nGetPCIInfo: invalid device: 1:-1.-1\n"},
      {{"-b1", "-s3", "-c"},
       "GetDevice: invalid slot 3\nPrintConfigSpace: invalid device: 1:3.-1\n"},
      {{"-b1", "-s2", "-f1", "-e"},
       "GetDevice: invalid func 1\nPrintExtConfigSpace: invalid device: 1:2.1\n"},
      {{"-b1", "-s2", "-f0", "-i"}, "GetPCIInfo: error fetching PCI information 0xbad0003\n"},
      {{"-b1", "-s2", "-f0", "-c"}, "PrintConfigSpace: error fetching PCI information 0xbad0003\n"},
      {{"-b1", "-s2", "-f0", "-e"},
       "PrintExtConfigSpace: error fetching PCI information 0xbad0003\n"},
  };
  for (const auto &[arguments, messages] : cases) {
    std::vector<std::string> commandLine = {"pci-info"};
    commandLine.insert(commandLine.end(), arguments.begin(), arguments.end());
    const Outcome outcome = Live(kHost, commandLine);
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.err, messages);
    EXPECT_EQ(outcome.status, 0);
  }
  EXPECT_EQ(Live("list hardware_pci_seg = status 5\n", {"pci-info", "-i"}).err,
            "GetPCIInfo: invalid device: -1:-1.-1\n");
}

TEST_F(PciInfoTest, FailedCalls) {
  const std::string invalid = "GetPCIInfo: invalid device: 1:2.3\n";
  const std::pair<Surroundings, std::string> cases[] = {
      {Failing("KIF_ParamListCreate", 1), "Failed to allocate param list (size = 1)\n" + invalid},
      {Failing("KIF_ParamListAddInt", 1), "Couldn't add param to list: 0xbad0001" + invalid},
      {Failing("KIF_ParamListAddInt", 4), "Couldn't add param to list: 0xbad0001" + invalid},
      {Failing("KIF_GetInstanceListAlloc", 3), invalid},
  };
  for (const auto &[surroundings, messages] : cases) {
    const Outcome outcome = Live(kHost, {"pci-info", "-b1", "-s2", "-f3", "-iS"}, surroundings);
    EXPECT_EQ(outcome.err, messages);
    EXPECT_EQ(outcome.out, " 12") << "each action finds the function anew";
    EXPECT_EQ(outcome.status, 0);
  }
}

TEST_F(PciInfoTest, Usage) {
  const std::string usage =
      "pci-info\n"
      "  -n <segment>      device segment (default: 0)\n"
      "  -b <bus>          device bus\n"
      "  -s <slot>         device slot\n"
      "  -f <function>     device function\n"
      "  -h                help\n"
      "  -i                print IRQ vector\n"
      "  -c                print PCI config space\n"
      "  -e                print PCI extended config space\n"
      "  -S                print physical slot\n";
  const struct {
    std::vector<std::string> arguments;
    std::string diagnostic;
    int status;
  } cases[] = {
      {{"pci-info"}, "", 1},
      {{"pci-info", "-b1", "-s2", "-f3"}, "", 1},
      {{"pci-info", "-ih"}, "", 0},
      {{"pci-info", "-i", "-x", "-h"}, "pci-info: invalid option -- 'x'\n", 1},
      {{"pci-info", "-ib"}, "pci-info: option requires an argument -- 'b'\n", 1},
  };
  for (const auto &[arguments, diagnostic, status] : cases) {
    const Outcome outcome = Cache(kHost, arguments);
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.err, diagnostic + usage);
    EXPECT_EQ(outcome.status, status);
  }
}

TEST_F(PciInfoTest, FullDisk) {
  const Outcome outcome = Run(
      {"sh", "-c",
       "exec " BIN_DIR "/zlkkiftools -c " + Record(kHost) + " pci-info -b1 -s2 -f3 -c >/dev/full"});
  EXPECT_NE(outcome.err, "");
  EXPECT_EQ(outcome.status, 1);
}

}  // namespace
