// The Linux machine as a host: which routine answers for which node.
#include "linux/linux_nodes.h"

namespace {

struct LinuxNode {
  NodeIndex node;
  InstancesMethod listInstances;
  RecordMethod getRecord;
};

// In the order of the table of nodes, so that a node's place finds its row.
constexpr LinuxNode kLinuxNodes[] = {
    {kNode_system_ntpclock_upTime, nullptr, GetUpTime},
    {kNode_sched_globalStats_numPcpus, nullptr, GetNumPcpus},
    {kNode_sched_groups_stats_cpuStatsDir_cpuLoadHistory_cpuLoadHistory1MinInPct, nullptr,
     GetLoadHistory},
    {kNode_sched_groups_stats_cpuStatsDir_cpuLoadHistory_cpuLoadHistory5MinInPct, nullptr,
     GetLoadHistory},
    {kNode_sched_groups_stats_cpuStatsDir_cpuLoadHistory_cpuLoadHistory15MinInPct, nullptr,
     GetLoadHistory},
    {kNode_world, ListWorlds, nullptr},
    {kNode_world_name, nullptr, GetWorldName},
    {kNode_world_info, nullptr, GetWorldInfo},
    {kNode_sched_Vcpus_stats_summaryStats, nullptr, GetSummaryStats},
    {kNode_sched_Vcpus_stats_affinity, nullptr, GetAffinity},
    {kNode_sched_Vcpus_stats_stateTimes, nullptr, GetStateTimes},
    {kNode_userworld_cartel, ListCartels, nullptr},
    {kNode_userworld_cartel_cmdline, nullptr, GetCommandLine},
    {kNode_userworld_cartel_child, ListChildren, GetChild},
    {kNode_userworld_cartel_fd_fds, ListDescriptors, GetDescriptor},
    {kNode_userworld_cartel_mem_mmaps, ListMappings, GetMapping},
    {kNode_hardware_pci_seg, ListPciSegments, nullptr},
    {kNode_hardware_pci_seg_bus, ListPciBuses, nullptr},
    {kNode_hardware_pci_seg_bus_slot, ListPciSlots, nullptr},
    {kNode_hardware_pci_seg_bus_slot_func, ListPciFunctions, nullptr},
    {kNode_hardware_pci_seg_bus_slot_func_pciConfigHeader, nullptr, GetPciConfigHeader},
    {kNode_hardware_pci_seg_bus_slot_func_pciConfigSpace, nullptr, GetPciConfigSpace},
    {kNode_hardware_pci_seg_bus_slot_func_pciExtConfigSpace, nullptr, GetPciConfigSpace},
    {kNode_system_modules, ListModuleNumbers, nullptr},
    {kNode_system_modules_general, nullptr, GetModule},
    {kNode_hardware_chipset_rtc, nullptr, GetClock},
    {kNode_system_version, nullptr, GetVersion},
    {kNode_system_bootOption, nullptr, GetBootOption},
    {kNode_system_bootCmdLine, nullptr, GetBootCommandLine},
    {kNode_system_bootMAC, nullptr, GetBootMac},
    {kNode_system_bootOptionFiles, ListBootOptionFiles, nullptr},
    {kNode_system_bootOptionFiles_content, nullptr, nullptr},
    {kNode_hardware_cpu_cpuInfo, nullptr, GetCpuInfo},
    {kNode_hardware_interrupts_cookieList, ListInterrupts, nullptr},
    {kNode_hardware_interrupts_cookieList_UsageStatus, nullptr, GetInterruptUsage},
    {kNode_hardware_interrupts_cookieList_PCPU, nullptr, GetInterruptCount},
    {kNode_hardware_interrupts_cookieList_ZLKDevices, ListInterruptDevices, nullptr},
    {kNode_hardware_acpi_tables, ListAcpiTables, nullptr},
    {kNode_hardware_acpi_tables_buffers, ListAcpiBuffers, GetAcpiBuffer},
    {kNode_system_morelfs_tardisks, ListTardisks, nullptr},
    {kNode_system_morelfs_tardisks_stats, nullptr, GetTardisk},
    {kNode_system_morelfs_ramdisks, ListRamdisks, nullptr},
    {kNode_system_morelfs_ramdisks_stats, nullptr, GetRamdisk},
    {kNode_system_morelfs_inodes, ListInodes, nullptr},
    {kNode_system_morelfs_inodes_stats, nullptr, GetInode},
};

constexpr bool InTableOrder() {
  for (size_t i = 0; i < kNodeCount; ++i) {
    if (kLinuxNodes[i].node != i) return false;
  }
  return sizeof(kLinuxNodes) / sizeof(kLinuxNodes[0]) == kNodeCount;
}
static_assert(InTableOrder());

// Whether `list` holds `parameters`; texts must have a value.
bool Selects(const KIF_ParamList *list, const ParameterTypes &parameters) {
  uint32_t count = 0;
  for (const char *types = parameters.types; types[count] != '\0'; ++count) {
    int64_t integer;
    const bool fits =
        types[count] == 'i' ? IntegerAt(list, count, &integer) : TextAt(list, count) != nullptr;
    if (!fits) return false;
  }
  return CountOf(list) == count;
}

KIF_Status GetLinuxRecord(const NodeInfo &node, const KIF_ParamList *instance, void *record) {
  if (!Selects(instance, node.offers.record)) return KIF_STATUS_BAD_PARAMETER;
  return kLinuxNodes[IndexOf(node)].getRecord(node, instance, record);
}

KIF_Status GetLinuxInstances(const NodeInfo &node, const KIF_ParamList *parent,
                             KIF_ParamList *list) {
  if (!Selects(parent, node.offers.list)) return KIF_STATUS_BAD_PARAMETER;
  return kLinuxNodes[IndexOf(node)].listInstances(node, parent, list);
}

// One node has content and one takes writes.
KIF_Status GetLinuxContentLength(const NodeInfo &node, const KIF_ParamList *instance,
                                 uint32_t *length) {
  if (!Selects(instance, node.offers.content)) return KIF_STATUS_BAD_PARAMETER;
  return GetBootOptionFileLength(node, instance, length);
}

KIF_Status GetLinuxContent(const NodeInfo &node, const KIF_ParamList *instance, uint32_t offset,
                           uint32_t wanted, void *bytes, uint32_t *given) {
  if (!Selects(instance, node.offers.content)) return KIF_STATUS_BAD_PARAMETER;
  return ReadBootOptionFile(node, instance, offset, wanted, bytes, given);
}

KIF_Status CheckLinuxSignature(char *date, bool *matches) {
  *matches = true;  // what is published here is published in the library's own interface
  return GetKernelBuildDate(date);
}

}  // namespace

const Host kLinuxHost = {
    GetLinuxRecord,  GetLinuxInstances, GetLinuxContentLength,
    GetLinuxContent, SetClock,          CheckLinuxSignature,
};
