// network_namespaces: one look at a link of each process.
#include "linux/network_namespaces.h"

#include <fcntl.h>
#include <stdio.h>
#include <sys/stat.h>

#include <algorithm>
#include <cstring>

#include "base/array.h"
#include "base/everlasting.h"
#include "linux/attributes.h"
#include "linux/linux_nodes.h"
#include "records/network.h"

namespace {

enum Field : unsigned { kDevice, kInode, kProcess, kIsRecorders };

struct Networks {
  bool read = false;
  Array<Network> all;  // by number
};

Everlasting<Networks> snapshot;

// Fills device and inode of the namespace of a process, "7" or "self".
bool ReadNamespace(int proc, const char *process, Network *network) {
  char path[300];
  snprintf(path, sizeof(path), "%s/ns/net", process);
  if (!IsForeignRoot()) {
    struct stat facts;
    if (fstatat(proc, path, &facts, 0) != 0) return false;
    network->device = facts.st_dev;
    network->inode = facts.st_ino;
    return true;
  }
  char target[64];
  if (ReadLinkBelow(proc, path, target, sizeof(target)) != KIF_STATUS_OK) return false;
  const char *place = target + strcspn(target, "0123456789");
  return TakeNumber(&place, &network->inode) && network->inode > kOwnNetwork &&
         network->inode <= INT64_MAX;
}

bool IsBefore(const Network &a, const Network &b) {
  return a.number != b.number ? a.number < b.number : a.process < b.process;
}

// Notes the namespace of each process that shows it; of a tree without links all are in one.
KIF_Status ReadProcesses(DirectoryReader *proc, const Network &own) {
  while (const char *name = proc->Next()) {
    const char *place = name;
    uint64_t process;
    if (!TakeNumber(&place, &process) || *place != '\0' || process > INT32_MAX) continue;
    Network network = {kOwnNetwork, 0, 0, static_cast<int32_t>(process)};
    if (!ReadNamespace(proc->fd(), name, &network) && !IsForeignRoot()) continue;
    const bool isOwn = network.inode == own.inode && network.device == own.device;
    if (!isOwn && network.inode != 0) network.number = static_cast<int64_t>(network.inode);
    if (!snapshot->all.Append(network)) return KIF_STATUS_NO_MEMORY;
  }
  return proc->status();
}

KIF_Status ReadNetworks() {
  snapshot->read = false;
  snapshot->all.Clear();
  DirectoryReader proc;
  KIF_Status status = proc.Open("/proc");
  if (status != KIF_STATUS_OK) return status;
  Network own = {kOwnNetwork, 0, 0, INT32_MAX};
  (void)(ReadNamespace(proc.fd(), "self", &own) || ReadNamespace(proc.fd(), "1", &own));
  Descriptor net;
  const bool isThere = OpenBelow(proc.fd(), "net", O_PATH | O_DIRECTORY, &net) == KIF_STATUS_OK;
  if (isThere && !snapshot->all.Append(own)) return KIF_STATUS_NO_MEMORY;
  status = ReadProcesses(&proc, own);
  if (status != KIF_STATUS_OK) return status;
  if (snapshot->all.size() == 0) return KIF_STATUS_NOT_FOUND;
  std::sort(snapshot->all.begin(), snapshot->all.end(), IsBefore);
  const Network *end =
      std::unique(snapshot->all.begin(), snapshot->all.end(),
                  [](const Network &a, const Network &b) { return a.number == b.number; });
  snapshot->all.Truncate(static_cast<size_t>(end - snapshot->all.begin()));
  Network &first = snapshot->all[0];
  if (first.process == INT32_MAX) first.process = 0;
  snapshot->read = true;
  return KIF_STATUS_OK;
}

}  // namespace

KIF_Status FindNetwork(int64_t number, const Network **network) {
  const KIF_Status status = snapshot->read ? KIF_STATUS_OK : ReadNetworks();
  if (status != KIF_STATUS_OK) return status;
  const Network *found =
      std::lower_bound(snapshot->all.begin(), snapshot->all.end(), number,
                       [](const Network &other, int64_t wanted) { return other.number < wanted; });
  if (found == snapshot->all.end() || found->number != number) return KIF_STATUS_NOT_FOUND;
  *network = found;
  return KIF_STATUS_OK;
}

KIF_Status OpenProcessIn(const Network &network, Descriptor *process) {
  char path[32];
  const bool isReaders = network.number == kOwnNetwork && !IsForeignRoot();
  snprintf(path, sizeof(path), isReaders || network.process == 0 ? "/proc/self" : "/proc/%d",
           network.process);
  const KIF_Status status = OpenHostFile(path, O_PATH | O_DIRECTORY, process);
  if (status != KIF_STATUS_OK || IsForeignRoot()) return status;
  Network present = {};
  const bool still = ReadNamespace(process->fd(), ".", &present) && present.inode == network.inode;
  return still ? KIF_STATUS_OK : KIF_STATUS_NOT_FOUND;
}

KIF_Status OpenNetworkFile(const Network &network, const char *name, Descriptor *file) {
  char path[64];
  Descriptor process;
  KIF_Status status = OpenProcessIn(network, &process);
  snprintf(path, sizeof(path), "net/%s", name);
  if (status == KIF_STATUS_OK) status = OpenBelow(process.fd(), path, O_RDONLY, file);
  if (status == KIF_STATUS_OK || !IsForeignRoot() || network.number != kOwnNetwork) return status;
  snprintf(path, sizeof(path), "/proc/net/%s", name);
  return OpenHostFile(path, O_RDONLY, file);
}

KIF_Status ListNetworks(const NodeInfo &, const KIF_ParamList *, KIF_ParamList *list) {
  KIF_Status status = ReadNetworks();
  for (const Network &network : snapshot->all) {
    if (status == KIF_STATUS_OK) status = KIF_ParamListAddInt(list, network.number);
  }
  return status;
}

KIF_Status GetNetwork(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  auto *answer = static_cast<NetworkNamespace *>(record);
  const Network *network;
  const KIF_Status status = FindNetwork(Integer(instance, 0), &network);
  if (status != KIF_STATUS_OK) return status;
  uint64_t known = 0;
  answer->device = network->device;
  answer->inode = network->inode;
  answer->process = static_cast<uint32_t>(network->process);
  answer->isRecorders = network->number == kOwnNetwork;
  Know(&known, kDevice, network->device != 0);
  Know(&known, kInode, network->inode != 0);
  Know(&known, kProcess, network->process != 0);
  // A tree that does not tell namespaces apart does not tell whose they are.
  Know(&known, kIsRecorders, network->inode != 0);
  answer->known = known;
  return KIF_STATUS_OK;
}
