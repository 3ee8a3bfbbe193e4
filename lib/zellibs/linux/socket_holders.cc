#include "linux/socket_holders.h"

#include <algorithm>
#include <cstring>

#include "base/array.h"
#include "base/everlasting.h"
#include "linux/files.h"
#include "linux/process_directory.h"
#include "linux/processes.h"
#include "status.h"

namespace {

struct Holders {
  Array<SocketHolder> all;  // by inode and process, when `sorted`
  Array<int32_t> listed;    // the processes whose descriptors were
  bool sorted = false;
  bool refused = false;
};

Everlasting<Holders> snapshot;

constexpr char kSocket[] = "socket:[";

KIF_Status ReadDescriptorsOf(int32_t process) {
  int directory;
  DirectoryReader descriptors;
  KIF_Status status = OpenProcessDirectory(process, true, &directory);
  if (status == KIF_STATUS_OK) status = descriptors.OpenBelow(directory, "fd");
  while (const char *name = status == KIF_STATUS_OK ? descriptors.Next() : nullptr) {
    char target[64];
    uint64_t inode;
    status = ReadLinkBelow(descriptors.fd(), name, target, sizeof(target));
    if (status == KIF_STATUS_NOT_FOUND) status = KIF_STATUS_OK;  // closed
    const char *place = target + sizeof(kSocket) - 1;
    const bool isSocket = strncmp(target, kSocket, sizeof(kSocket) - 1) == 0;
    if (isSocket && TakeNumber(&place, &inode)) status = NoteHolder(process, inode);
  }
  if (status == KIF_STATUS_NO_MEMORY || status == KIF_STATUS_NO_RESOURCES) return status;
  if (status != KIF_STATUS_OK && status != KIF_STATUS_NOT_FOUND) NoteRefusal();
  return KIF_STATUS_OK;
}

bool IsBefore(const SocketHolder &a, const SocketHolder &b) {
  return a.inode != b.inode ? a.inode < b.inode : a.process < b.process;
}

KIF_Status AppendCartel(int32_t id, void *context) {
  return static_cast<Array<int32_t> *>(context)->Append(id) ? KIF_STATUS_OK : KIF_STATUS_NO_MEMORY;
}

}  // namespace

KIF_Status NoteDescriptorsOf(int64_t process) {
  snapshot->sorted = false;
  return snapshot->listed.Append(static_cast<int32_t>(process)) ? KIF_STATUS_OK
                                                                : KIF_STATUS_NO_MEMORY;
}

KIF_Status NoteHolder(int64_t process, uint64_t inode) {
  snapshot->sorted = false;
  return snapshot->all.Append({inode, static_cast<int32_t>(process)}) ? KIF_STATUS_OK
                                                                      : KIF_STATUS_NO_MEMORY;
}

void NoteRefusal() {
  snapshot->refused = true;
}

KIF_Status ReadRemainingHolders() {
  Array<int32_t> cartels;
  KIF_Status status = ForEachCartel(AppendCartel, &cartels);
  if (status == KIF_STATUS_OK && cartels.size() == 0) {
    status = TakeCartels();
    if (status == KIF_STATUS_OK) status = ForEachCartel(AppendCartel, &cartels);
  }
  Array<int32_t> &listed = snapshot->listed;
  std::sort(listed.begin(), listed.end());
  const size_t before = listed.size();
  for (const int32_t id : cartels) {
    if (status != KIF_STATUS_OK) return status;
    if (std::binary_search(listed.begin(), listed.begin() + before, id)) continue;
    status = NoteDescriptorsOf(id);
    if (status == KIF_STATUS_OK) status = ReadDescriptorsOf(id);
  }
  if (status != KIF_STATUS_OK || snapshot->sorted) return status;
  std::sort(snapshot->all.begin(), snapshot->all.end(), IsBefore);
  const SocketHolder *end = std::unique(snapshot->all.begin(), snapshot->all.end(),
                                        [](const SocketHolder &a, const SocketHolder &b) {
                                          return a.inode == b.inode && a.process == b.process;
                                        });
  snapshot->all.Truncate(static_cast<size_t>(end - snapshot->all.begin()));
  snapshot->sorted = true;
  return KIF_STATUS_OK;
}

void FindHolders(uint64_t inode, const SocketHolder **first, const SocketHolder **end,
                 bool *certain) {
  *first = std::lower_bound(snapshot->all.begin(), snapshot->all.end(), SocketHolder{inode, 0},
                            IsBefore);
  *end = std::upper_bound(*first, static_cast<const SocketHolder *>(snapshot->all.end()),
                          SocketHolder{inode, INT32_MAX}, IsBefore);
  *certain = !snapshot->refused;
}
