// network_interfaces: by rtnetlink and /sys/class/net in the reader's namespace, by net/dev
// elsewhere.
#include <fcntl.h>
#include <limits.h>
#include <net/if_arp.h>
#include <stdio.h>

#include <algorithm>
#include <cstring>
#include <iterator>

#include "base/array.h"
#include "base/everlasting.h"
#include "linux/attributes.h"
#include "linux/linux_nodes.h"
#include "linux/netlink_dump.h"
#include "linux/network_namespaces.h"
#include "records/network.h"

namespace {

// The places of the fields behind `known`.
enum Field : unsigned {
  kNumber,
  kFlags,
  kMtu,
  kSpeed,
  kMaster,
  kCarrier,
  kReceivedBytes,
  kReceivedPackets,
  kReceiveErrors,
  kReceiveDrops,
  kSentBytes,
  kSentPackets,
  kSendErrors,
  kSendDrops,
  kName,
  kKind,
  kDriver,
  kPciFunction,
  kAddress
};

struct Interface {
  int64_t number;
  NetworkInterface record;
};

// Those of the namespace that was listed last.
struct Interfaces {
  int64_t network = 0;
  Array<Interface> all;  // by number
};

Everlasting<Interfaces> snapshot;

constexpr char kClass[] = "/sys/class/net";

void KnowAll(unsigned first, unsigned last, NetworkInterface *record) {
  uint64_t known = record->known;
  for (unsigned field = first; field <= last; ++field) Know(&known, field, true);
  record->known = known;
}

void KnowField(NetworkInterface *record, unsigned field, bool is) {
  if (is) KnowAll(field, field, record);
}

void PutText(NetworkInterface *record, Field field, char *text, size_t size, const char *bytes,
             size_t length) {
  memset(text, 0, size);  // what made an interface comes behind the medium's kind
  CopyText(text, size, bytes, strnlen(bytes, length));
  KnowField(record, field, text[0] != '\0');
}

void PutAddress(const char *bytes, size_t size, NetworkInterface *record) {
  constexpr size_t kLongest = sizeof(record->address) / 3;
  if (size == 0 || size > kLongest) return;
  char *to = record->address;
  for (size_t i = 0; i < size; ++i) {
    to += snprintf(to, 4, "%s%02x", i > 0 ? ":" : "", static_cast<unsigned char>(bytes[i]));
  }
  KnowField(record, kAddress, true);
}

void PutCounts(const rtnl_link_stats64 &counts, NetworkInterface *record) {
  record->receivedBytes = counts.rx_bytes;
  record->receivedPackets = counts.rx_packets;
  record->receiveErrors = counts.rx_errors;
  record->receiveDrops = counts.rx_dropped;
  record->sentBytes = counts.tx_bytes;
  record->sentPackets = counts.tx_packets;
  record->sendErrors = counts.tx_errors;
  record->sendDrops = counts.tx_dropped;
  KnowAll(kReceivedBytes, kSendDrops, record);
}

// The medium's kind, where nothing made the interface; the kernel's numbers, iproute2's names.
void PutMedium(unsigned medium, NetworkInterface *record) {
  const char *kind = medium == ARPHRD_ETHER        ? "ether"
                     : medium == ARPHRD_LOOPBACK   ? "loopback"
                     : medium == ARPHRD_INFINIBAND ? "infiniband"
                     : medium == ARPHRD_PPP        ? "ppp"
                     : medium == ARPHRD_NONE       ? "none"
                                                   : "";
  PutText(record, kKind, record->kind, sizeof(record->kind), kind, strlen(kind));
}

uint32_t NumberIn(const char *bytes, size_t size) {
  uint32_t number = 0;
  memcpy(&number, bytes, std::min(size, sizeof(number)));
  return number;
}

void PutAttribute(unsigned type, const char *bytes, size_t size, NetworkInterface *record) {
  switch (type) {
    case IFLA_IFNAME:
      return PutText(record, kName, record->name, sizeof(record->name), bytes, size);
    case IFLA_ADDRESS:
      return PutAddress(bytes, size, record);
    case IFLA_MTU:
      record->mtu = NumberIn(bytes, size);
      return KnowField(record, kMtu, true);
    case IFLA_MASTER:
      record->master = NumberIn(bytes, size);
      return;
    case IFLA_CARRIER:
      record->carrier = size > 0 && bytes[0] != 0;
      return KnowField(record, kCarrier, true);
    case IFLA_STATS64: {
      rtnl_link_stats64 counts = {};
      memcpy(&counts, bytes, std::min(size, sizeof(counts)));
      return PutCounts(counts, record);
    }
    case IFLA_LINKINFO:
      return ForEachAttribute(bytes, size, [&](unsigned inner, const char *kind, size_t length) {
        if (inner != IFLA_INFO_KIND) return;
        PutText(record, kKind, record->kind, sizeof(record->kind), kind, length);
      });
    default:
      return;
  }
}

KIF_Status ReadLinks() {
  Bytes answers;
  const KIF_Status status = DumpNetlink(RTM_GETLINK, &answers);
  if (status != KIF_STATUS_OK) return status;
  return ForEachMessage<ifinfomsg>(
      answers, RTM_NEWLINK, [](const ifinfomsg &link, const char *attributes, size_t size) {
        Interface interface = {link.ifi_index, {}};
        NetworkInterface *record = &interface.record;
        record->number = static_cast<uint32_t>(link.ifi_index);
        record->flags = link.ifi_flags;
        for (const unsigned field : {kNumber, kFlags, kMaster}) KnowField(record, field, true);
        PutMedium(link.ifi_type, record);
        ForEachAttribute(attributes, size, [&](unsigned type, const char *bytes, size_t length) {
          PutAttribute(type, bytes, length, record);
        });
        return snapshot->all.Append(interface) ? KIF_STATUS_OK : KIF_STATUS_NO_MEMORY;
      });
}

// "  eth0: 1 2 3 ...", sixteen numbers.
bool ParseLine(const char *line, NetworkInterface *record) {
  constexpr size_t kCount = 16;
  constexpr size_t kBytesIn = 0, kPacketsIn = 1, kErrorsIn = 2, kDropsIn = 3;
  constexpr size_t kBytesOut = 8, kPacketsOut = 9, kErrorsOut = 10, kDropsOut = 11;
  line += strspn(line, " ");
  const size_t length = strcspn(line, ":\n");
  if (length == 0 || length >= sizeof(record->name) || line[length] != ':') return false;
  const char *place = line + length + 1;
  uint64_t counts[kCount];
  for (uint64_t &count : counts) {
    place += strspn(place, " ");
    if (!TakeNumber(&place, &count)) return false;
  }
  rtnl_link_stats64 told = {};
  told.rx_bytes = counts[kBytesIn];
  told.rx_packets = counts[kPacketsIn];
  told.rx_errors = counts[kErrorsIn];
  told.rx_dropped = counts[kDropsIn];
  told.tx_bytes = counts[kBytesOut];
  told.tx_packets = counts[kPacketsOut];
  told.tx_errors = counts[kErrorsOut];
  told.tx_dropped = counts[kDropsOut];
  PutCounts(told, record);
  PutText(record, kName, record->name, sizeof(record->name), line, length);
  return true;
}

// The index of an interface of a tree, where /sys was taken, too.
bool ReadIndex(const char *name, uint64_t *index) {
  char path[sizeof(kClass) + sizeof(NetworkInterface::name) + 16];
  if (strchr(name, '/') != nullptr || name[0] == '.') return false;
  snprintf(path, sizeof(path), "%s/%s/ifindex", kClass, name);
  return ReadNumber(AT_FDCWD, path, index) && *index > 0 && *index <= INT32_MAX;
}

KIF_Status ReadDevices(const Network &network) {
  Descriptor file;
  Bytes text;
  KIF_Status status = OpenNetworkFile(network, "dev", &file);
  if (status == KIF_STATUS_OK) status = ReadWhole(file, &text);
  if (status != KIF_STATUS_OK) return status;
  int64_t unknown = 0;
  for (const char *line = text.text(); *line != '\0';) {
    Interface interface = {};
    if (ParseLine(line, &interface.record)) {
      uint64_t index = 0;
      const bool isOwn = network.number == kOwnNetwork;
      const bool known = isOwn && ReadIndex(interface.record.name, &index);
      interface.number = known ? static_cast<int64_t>(index) : --unknown;
      interface.record.number = known ? static_cast<uint32_t>(index) : 0;
      KnowField(&interface.record, kNumber, known);
      if (!snapshot->all.Append(interface)) return KIF_STATUS_NO_MEMORY;
    }
    line += strcspn(line, "\n");
    line += strspn(line, "\n");
  }
  return KIF_STATUS_OK;
}

KIF_Status ReadInterfaces(int64_t number) {
  snapshot->network = 0;
  snapshot->all.Clear();
  const Network *network;
  KIF_Status status = FindNetwork(number, &network);
  if (status != KIF_STATUS_OK) return status;
  const bool asked = number == kOwnNetwork && !IsForeignRoot();
  status = asked ? ReadLinks() : KIF_STATUS_NOT_FOUND;
  if (status == KIF_STATUS_NOT_FOUND) status = ReadDevices(*network);
  if (status != KIF_STATUS_OK) return status;
  std::sort(snapshot->all.begin(), snapshot->all.end(),
            [](const Interface &a, const Interface &b) { return a.number < b.number; });
  snapshot->network = number;
  return KIF_STATUS_OK;
}

// What /sys adds of the interface that has the same name and index there.
void AddClass(NetworkInterface *record) {
  char path[sizeof(kClass) + sizeof(record->name)];
  char target[PATH_MAX];
  uint64_t index;
  Descriptor folder;
  if (!ReadIndex(record->name, &index) || index != record->number) return;
  snprintf(path, sizeof(path), "%s/%s", kClass, record->name);
  if (OpenHostFile(path, O_PATH | O_DIRECTORY, &folder) != KIF_STATUS_OK) return;
  uint64_t speed;
  // An interface without a carrier has no speed: -1, or none is told.
  if (ReadNumber(folder.fd(), "speed", &speed) && speed < UINT32_MAX) {
    record->speed = static_cast<uint32_t>(speed);
    KnowField(record, kSpeed, true);
  }
  KnowField(record, kDriver,
            ReadLastName(folder.fd(), "device/driver", record->driver, sizeof(record->driver)));
  const bool placed = ReadLinkBelow(AT_FDCWD, path, target, sizeof(target)) == KIF_STATUS_OK;
  KnowField(record, kPciFunction,
            placed && FindPciFunction(target, record->pciFunction, sizeof(record->pciFunction)));
}

}  // namespace

KIF_Status ListInterfaces(const NodeInfo &, const KIF_ParamList *parent, KIF_ParamList *list) {
  KIF_Status status = ReadInterfaces(Integer(parent, 0));
  if (status != KIF_STATUS_OK) return status;
  for (const Interface &interface : snapshot->all) {
    if (status == KIF_STATUS_OK) status = KIF_ParamListAddInt(list, interface.number);
  }
  return status;
}

KIF_Status GetInterface(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  const int64_t network = Integer(instance, 0);
  const KIF_Status status = network == snapshot->network ? KIF_STATUS_OK : ReadInterfaces(network);
  if (status != KIF_STATUS_OK) return status;
  const Interface *found =
      std::lower_bound(snapshot->all.begin(), snapshot->all.end(), Integer(instance, 1),
                       [](const Interface &a, int64_t wanted) { return a.number < wanted; });
  const bool isThere = found != snapshot->all.end() && found->number == Integer(instance, 1);
  if (!isThere) return KIF_STATUS_NOT_FOUND;
  auto *answer = static_cast<NetworkInterface *>(record);
  *answer = found->record;
  if (network == kOwnNetwork) AddClass(answer);
  return KIF_STATUS_OK;
}
