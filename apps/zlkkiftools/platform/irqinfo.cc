// irqinfo: the interrupt cookies, how often each was taken on every PCPU, and who uses it.
#include <inttypes.h>
#include <stdio.h>

#include "kif/kif.h"
#include "output.h"
#include "records/platform.h"
#include "tools.h"

namespace {

constexpr size_t kDeviceTextSize = 64;

const char *DeviceName(KIF_Param *device) {
  const bool isText = device != nullptr && device->type == KIF_PARAM_STRING;
  const char *name = isText ? KIF_ParamGetString(device) : nullptr;
  return name != nullptr ? name : "device";
}

// The names of the devices, cut to what `text` holds.
void JoinDevices(KIF_ParamList *devices, char (&text)[kDeviceTextSize]) {
  const int32_t count = KIF_ParamListUsedCount(devices);
  text[0] = '\0';
  size_t length = 0;
  for (int32_t k = 0; k < count && length < sizeof(text); ++k) {
    const char *name = DeviceName(KIF_ParamListGetParam(devices, static_cast<uint32_t>(k)));
    const char *separator = k < count - 1 ? ", " : "";
    const int wanted = snprintf(text + length, sizeof(text) - length, "ZLK %s%s", name, separator);
    if (wanted > 0) length += static_cast<size_t>(wanted);
  }
}

// The cells of one row; `cookie` selects it. A count that cannot be read leaves its cell blank.
bool PrintCounts(KIF_ParamList *cookie, uint32_t numPcpus) {
  for (uint32_t pcpu = 0; pcpu < numPcpus; ++pcpu) {
    const AppendedInt appended(cookie, pcpu);
    if (appended.status() != 0) {
      fprintf(Messages(), "Couldn't add param to list: %#x", appended.status());
      return false;
    }
    PcpuCount record = {};
    if (ReadRecord(KIF_NODE_hardware_interrupts_cookieList_PCPU, cookie, &record) == 0) {
      printf("%10" PRIu64 " ", record.count);
    } else {
      printf("%11s", "");
    }
  }
  return true;
}

bool PrintDevices(KIF_ParamList *cookie, const UsageStatus &usage) {
  ParamListHandle devices;
  const KIF_Status status =
      GetInstanceList(KIF_NODE_hardware_interrupts_cookieList_ZLKDevices, cookie, &devices);
  if (status != 0) {
    fprintf(Messages(), "InterruptInfo: error fetching interrupt device list - 0x%x\n", status);
    return false;
  }
  char text[kDeviceTextSize] = "<ZLK device>";
  if (usage.usage != 0) JoinDevices(devices.get(), text);
  devices.reset();
  printf("%s\n", Shown(text).text());
  return true;
}

bool PrintCookie(KIF_Param *param, KIF_ParamList *cookie, uint32_t numPcpus) {
  const auto value = static_cast<uint64_t>(KIF_ParamGetInt(param));
  UsageStatus usage = {};
  if (ReadRecord(KIF_NODE_hardware_interrupts_cookieList_UsageStatus, cookie, &usage) != 0) {
    fprintf(Messages(), "InterruptInfo: error fetching interrupt info - 0x%" PRIx64 "\n", value);
    return false;
  }
  printf("0x%04" PRIx64 ":", value);
  return PrintCounts(cookie, numPcpus) && PrintDevices(cookie, usage);
}

int InterruptInfo(int argc) {
  if (argc > 1) {
    fputs("irqinfo:      List interrupt information\n", Messages());
    return 1;
  }
  const ParamListHandle selector = CreateInstance();
  if (selector == nullptr) {
    fputs("InterruptInfo: Not enough memory\n", Messages());
    return 1;
  }
  CpuInfo cpuInfo = {};
  KIF_Status status = ReadRecord(KIF_NODE_hardware_cpu_cpuInfo, nullptr, &cpuInfo);
  if (status != 0) {
    fprintf(Messages(), "InterruptInfo: error fetching number of CPUs - 0x%x\n", status);
    return 1;
  }
  ParamListHandle cookies;
  status = GetInstanceList(KIF_NODE_hardware_interrupts_cookieList, nullptr, &cookies);
  if (status != 0) {
    fprintf(Messages(), "InterruptInfo: error fetching interrupt list - 0x%x\n", status);
    return 1;
  }
  fputs("Cookie ", stdout);
  for (uint32_t pcpu = 0; pcpu < cpuInfo.numPcpus; ++pcpu) printf("   PCPU %2u ", pcpu);
  putchar('\n');

  InstanceWalk walk(cookies.get(), selector.get());
  while (walk.Next()) {
    if (!PrintCookie(walk.param(), selector.get(), cpuInfo.numPcpus)) return 1;
  }
  if (!walk.failed()) return 0;
  fputs("InterruptInfo: error requesting interrupt info - 0x0\n", Messages());
  return 1;
}

}  // namespace

int IrqinfoEntry(int argc, char **) {
  return InterruptInfo(argc);
}
