// network_sockets: the internet tables of a namespace, and who holds what is in them.
#include <arpa/inet.h>
#include <stdio.h>

#include <algorithm>
#include <cstring>

#include "base/array.h"
#include "base/everlasting.h"
#include "linux/attributes.h"
#include "linux/linux_nodes.h"
#include "linux/network_namespaces.h"
#include "linux/socket_holders.h"
#include "linux/sockets.h"
#include "records/network.h"

namespace {

// The places of the fields behind `known`.
enum Field : unsigned {
  kInode,
  kSendQueue,
  kReceiveQueue,
  kUser,
  kCartelCount,
  kLocalPort,
  kRemotePort,
  kProtocol,
  kState,
  kLocalAddress,
  kRemoteAddress,
  kCartels
};

// Those of the namespace that was listed last, in the kernel's order; the number of each is its
// place, from 1.
struct Listed {
  int64_t network = 0;
  Array<InternetSocket> all;
};

Everlasting<Listed> snapshot;

KIF_Status Append(const InternetSocket &socket, void *) {
  return snapshot->all.Append(socket) ? KIF_STATUS_OK : KIF_STATUS_NO_MEMORY;
}

KIF_Status ReadSockets(int64_t number) {
  snapshot->network = 0;
  snapshot->all.Clear();
  const Network *network;
  Descriptor process;
  KIF_Status status = FindNetwork(number, &network);
  if (status == KIF_STATUS_OK) status = OpenProcessIn(*network, &process);
  if (status == KIF_STATUS_OK) {
    status = ForEachInternetSocket(process.fd(), Append, nullptr);
  }
  if (status == KIF_STATUS_OK) status = ReadRemainingHolders();
  if (status == KIF_STATUS_OK) snapshot->network = number;
  return status;
}

template <size_t kSize>
void PutAddress(const Endpoint &endpoint, char (&field)[kSize]) {
  static_assert(kSize >= INET6_ADDRSTRLEN);
  inet_ntop(endpoint.size == 16 ? AF_INET6 : AF_INET, endpoint.address, field, kSize);
}

// As many numbers as there is room for.
template <size_t kSize>
void PutCartels(const SocketHolder *first, const SocketHolder *end, char (&field)[kSize]) {
  size_t filled = 0;
  for (const SocketHolder *holder = first; holder != end; ++holder) {
    char number[16];
    const int length =
        snprintf(number, sizeof(number), "%s%d", filled > 0 ? "," : "", holder->process);
    if (filled + static_cast<size_t>(length) >= kSize) return;
    memcpy(field + filled, number, static_cast<size_t>(length));
    filled += static_cast<size_t>(length);
  }
}

// Nobody holds what has no inode number.
void PutHolders(uint64_t inode, NetworkSocket *record, uint64_t *known) {
  const SocketHolder *first = nullptr;
  const SocketHolder *end = nullptr;
  bool certain = true;
  if (inode != 0) FindHolders(inode, &first, &end, &certain);
  if (certain) record->cartelCount = static_cast<uint32_t>(end - first);
  PutCartels(first, end, record->cartels);
  Know(known, kCartelCount, certain);
  Know(known, kCartels, certain || first != end);
}

}  // namespace

KIF_Status ListSockets(const NodeInfo &, const KIF_ParamList *parent, KIF_ParamList *list) {
  KIF_Status status = ReadSockets(Integer(parent, 0));
  if (status != KIF_STATUS_OK) return status;
  for (size_t i = 1; status == KIF_STATUS_OK && i <= snapshot->all.size(); ++i) {
    status = KIF_ParamListAddInt(list, static_cast<int64_t>(i));
  }
  return status;
}

KIF_Status GetSocket(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  const int64_t network = Integer(instance, 0);
  const int64_t number = Integer(instance, 1);
  const KIF_Status status = network == snapshot->network ? KIF_STATUS_OK : ReadSockets(network);
  if (status != KIF_STATUS_OK) return status;
  const bool isThere = number >= 1 && static_cast<uint64_t>(number) <= snapshot->all.size();
  if (!isThere) return KIF_STATUS_NOT_FOUND;
  const InternetSocket &socket = snapshot->all[static_cast<size_t>(number) - 1];
  auto *answer = static_cast<NetworkSocket *>(record);
  uint64_t known = 0;
  answer->inode = socket.inode;
  answer->sendQueue = socket.sendQueue;
  answer->receiveQueue = socket.receiveQueue;
  answer->user = socket.user;
  answer->localPort = static_cast<uint16_t>(socket.local.port);
  answer->remotePort = static_cast<uint16_t>(socket.remote.port);
  snprintf(answer->protocol, sizeof(answer->protocol), "%s", socket.protocol);
  snprintf(answer->state, sizeof(answer->state), "%s", socket.state != nullptr ? socket.state : "");
  PutAddress(socket.local, answer->localAddress);
  PutAddress(socket.remote, answer->remoteAddress);
  for (const unsigned field : {kInode, kSendQueue, kReceiveQueue, kUser, kLocalPort, kRemotePort,
                               kProtocol, kLocalAddress, kRemoteAddress}) {
    Know(&known, field, true);
  }
  Know(&known, kState, socket.state != nullptr);
  PutHolders(socket.inode, answer, &known);
  answer->known = known;
  return KIF_STATUS_OK;
}
