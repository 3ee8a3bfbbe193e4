// Stand-ins for the tools that are not in this build yet; a tool's own entry takes the place of its
// stand-in when the program is linked.
#include <stdio.h>

#include "tools.h"

namespace {

int NotInThisBuild(const char *tool) {
  fprintf(stderr, "%s: not in this build\n", tool);
  return 1;
}

}  // namespace

#define STAND_IN(Entry, tool)                     \
  __attribute__((weak)) int Entry(int, char **) { \
    return NotInThisBuild(tool);                  \
  }

STAND_IN(LspciEntry, "lspci")
STAND_IN(PsEntry, "ps")
STAND_IN(HwclockEntry, "hwclock")
STAND_IN(ZelvarEntry, "zelvar")
STAND_IN(IrqinfoEntry, "irqinfo")
STAND_IN(BootOptionEntry, "bootOption")
STAND_IN(AmldumpEntry, "amldump")
STAND_IN(PciInfoEntry, "pci-info")
STAND_IN(PidofEntry, "pidof")
STAND_IN(UserspaceofEntry, "userspaceof")
STAND_IN(MduEntry, "mdu")
STAND_IN(LsofEntry, "lsof")
STAND_IN(MdfEntry, "mdf")
STAND_IN(PkillEntry, "pkill")
STAND_IN(PgrepEntry, "pgrep")
STAND_IN(UptimeEntry, "uptime")
