// What the subtrees of the Linux host answer; one source file for each. All of them have the
// methods of Host (host.h): parameters are checked for number and type before they are called,
// records are zero, lists empty.
#pragma once

#include "host.h"
#include "param_list.h"
#include "status.h"

// The integer at `index` of a list that has been checked.
inline int64_t Integer(const KIF_ParamList *list, uint32_t index) {
  return list->params[index].integer;
}

using RecordMethod = KIF_Status (*)(const NodeInfo &node, const KIF_ParamList *instance,
                                    void *record);
using InstancesMethod = KIF_Status (*)(const NodeInfo &node, const KIF_ParamList *parent,
                                       KIF_ParamList *list);

// scheduler.cc
KIF_Status GetUpTime(const NodeInfo &node, const KIF_ParamList *instance, void *record);
KIF_Status GetNumPcpus(const NodeInfo &node, const KIF_ParamList *instance, void *record);
KIF_Status GetCpuInfo(const NodeInfo &node, const KIF_ParamList *instance, void *record);
KIF_Status GetLoadHistory(const NodeInfo &node, const KIF_ParamList *instance, void *record);
KIF_Status GetAffinity(const NodeInfo &node, const KIF_ParamList *instance, void *record);

// worlds.cc
KIF_Status ListWorlds(const NodeInfo &node, const KIF_ParamList *parent, KIF_ParamList *list);
KIF_Status GetWorldName(const NodeInfo &node, const KIF_ParamList *instance, void *record);
KIF_Status GetWorldInfo(const NodeInfo &node, const KIF_ParamList *instance, void *record);
KIF_Status GetSummaryStats(const NodeInfo &node, const KIF_ParamList *instance, void *record);
KIF_Status GetStateTimes(const NodeInfo &node, const KIF_ParamList *instance, void *record);
KIF_Status ListCartels(const NodeInfo &node, const KIF_ParamList *parent, KIF_ParamList *list);
KIF_Status GetCommandLine(const NodeInfo &node, const KIF_ParamList *instance, void *record);
KIF_Status ListChildren(const NodeInfo &node, const KIF_ParamList *parent, KIF_ParamList *list);
KIF_Status GetChild(const NodeInfo &node, const KIF_ParamList *instance, void *record);

// descriptors.cc
KIF_Status ListDescriptors(const NodeInfo &node, const KIF_ParamList *parent, KIF_ParamList *list);
KIF_Status GetDescriptor(const NodeInfo &node, const KIF_ParamList *instance, void *record);

// mappings.cc
KIF_Status ListMappings(const NodeInfo &node, const KIF_ParamList *parent, KIF_ParamList *list);
KIF_Status GetMapping(const NodeInfo &node, const KIF_ParamList *instance, void *record);

// pci.cc
KIF_Status ListPciSegments(const NodeInfo &node, const KIF_ParamList *parent, KIF_ParamList *list);
KIF_Status ListPciBuses(const NodeInfo &node, const KIF_ParamList *parent, KIF_ParamList *list);
KIF_Status ListPciSlots(const NodeInfo &node, const KIF_ParamList *parent, KIF_ParamList *list);
KIF_Status ListPciFunctions(const NodeInfo &node, const KIF_ParamList *parent, KIF_ParamList *list);
KIF_Status GetPciConfigHeader(const NodeInfo &node, const KIF_ParamList *instance, void *record);
KIF_Status GetPciConfigSpace(const NodeInfo &node, const KIF_ParamList *instance, void *record);

// modules.cc
KIF_Status ListModuleNumbers(const NodeInfo &node, const KIF_ParamList *parent,
                             KIF_ParamList *list);
KIF_Status GetModule(const NodeInfo &node, const KIF_ParamList *instance, void *record);

// interrupts.cc
KIF_Status ListInterrupts(const NodeInfo &node, const KIF_ParamList *parent, KIF_ParamList *list);
KIF_Status GetInterruptUsage(const NodeInfo &node, const KIF_ParamList *instance, void *record);
KIF_Status GetInterruptCount(const NodeInfo &node, const KIF_ParamList *instance, void *record);
KIF_Status ListInterruptDevices(const NodeInfo &node, const KIF_ParamList *parent,
                                KIF_ParamList *list);

// acpi.cc
KIF_Status ListAcpiTables(const NodeInfo &node, const KIF_ParamList *parent, KIF_ParamList *list);
KIF_Status ListAcpiBuffers(const NodeInfo &node, const KIF_ParamList *parent, KIF_ParamList *list);
KIF_Status GetAcpiBuffer(const NodeInfo &node, const KIF_ParamList *instance, void *record);

// clock.cc
KIF_Status GetClock(const NodeInfo &node, const KIF_ParamList *instance, void *record);
KIF_Status SetClock(const NodeInfo &node, const KIF_ParamList *instance,
                    const KIF_ParamList *input);

// version.cc
KIF_Status GetVersion(const NodeInfo &node, const KIF_ParamList *instance, void *record);

// Writes the kernel's build date to `date` (21 bytes, terminated).
KIF_Status GetKernelBuildDate(char *date);

// boot.cc
KIF_Status GetBootOption(const NodeInfo &node, const KIF_ParamList *instance, void *record);
KIF_Status GetBootCommandLine(const NodeInfo &node, const KIF_ParamList *instance, void *record);
KIF_Status GetBootMac(const NodeInfo &node, const KIF_ParamList *instance, void *record);
KIF_Status ListBootOptionFiles(const NodeInfo &node, const KIF_ParamList *parent,
                               KIF_ParamList *list);
KIF_Status GetBootOptionFileLength(const NodeInfo &node, const KIF_ParamList *instance,
                                   uint32_t *length);
KIF_Status ReadBootOptionFile(const NodeInfo &node, const KIF_ParamList *instance, uint32_t offset,
                              uint32_t wanted, void *bytes, uint32_t *given);

// morelfs.cc
KIF_Status ListTardisks(const NodeInfo &node, const KIF_ParamList *parent, KIF_ParamList *list);
KIF_Status GetTardisk(const NodeInfo &node, const KIF_ParamList *instance, void *record);
KIF_Status ListRamdisks(const NodeInfo &node, const KIF_ParamList *parent, KIF_ParamList *list);
KIF_Status GetRamdisk(const NodeInfo &node, const KIF_ParamList *instance, void *record);
KIF_Status ListInodes(const NodeInfo &node, const KIF_ParamList *parent, KIF_ParamList *list);
KIF_Status GetInode(const NodeInfo &node, const KIF_ParamList *instance, void *record);
