#include "linux/sockets.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <stdio.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <iterator>

#include "base/array.h"
#include "base/everlasting.h"
#include "linux/files.h"
#include "status.h"

namespace {

enum class Layout : uint8_t { kInternet, kUnix, kNetlink, kPacket };

struct Table {
  const char *file;       // in /proc/net
  const char *protocol;   // as it is shown
  const char *attribute;  // what its sockets' attributes name
  Layout layout;
  uint8_t inodeField;  // fields of a line are counted from 0
};

// What an earlier table says of a socket counts: everyone may give a unix socket a name that looks
// like a row of its table.
constexpr Table kTables[] = {
    {"tcp", "TCP", "TCP", Layout::kInternet, 9},
    {"tcp6", "TCP6", "TCPv6", Layout::kInternet, 9},
    {"udp", "UDP", "UDP", Layout::kInternet, 9},
    {"udp6", "UDP6", "UDPv6", Layout::kInternet, 9},
    {"udplite", "UDPLITE", "UDP-Lite", Layout::kInternet, 9},
    {"udplite6", "UDPLITE6", "UDPLITEv6", Layout::kInternet, 9},
    {"raw", "RAW", "RAW", Layout::kInternet, 9},
    {"raw6", "RAW6", "RAWv6", Layout::kInternet, 9},
    {"icmp", "ICMP", "PING", Layout::kInternet, 9},
    {"icmp6", "ICMP6", "PINGv6", Layout::kInternet, 9},
    {"netlink", "netlink", "NETLINK", Layout::kNetlink, 9},
    {"packet", "packet", "PACKET", Layout::kPacket, 8},
    {"unix", "unix", "UNIX", Layout::kUnix, 6},
};

// include/net/tcp_states.h
constexpr const char *kTcpStates[] = {
    nullptr, "ESTABLISHED", "SYN_SENT", "SYN_RECV", "FIN_WAIT1", "FIN_WAIT2", "TIME_WAIT",
    "CLOSE", "CLOSE_WAIT",  "LAST_ACK", "LISTEN",   "CLOSING",   "SYN_RECV",  "BOUND",
};

// include/uapi/linux/net.h, socket_state
constexpr const char *kUnixStates[] = {
    nullptr, "UNCONNECTED", "CONNECTING", "CONNECTED", "DISCONNECTING",
};
constexpr unsigned long kAcceptsConnections = 0x10000;  // __SO_ACCEPTCON, include/linux/net.h

// include/linux/net.h, sock_type
constexpr const char *kTypes[] = {nullptr, "STREAM", "DGRAM", "RAW", "RDM", "SEQPACKET", "DCCP"};

// include/uapi/linux/netlink.h
constexpr const char *kNetlinkProtocols[] = {
    "ROUTE",         nullptr,    "USERSOCK", "FIREWALL",       "SOCK_DIAG",  "NFLOG",
    "XFRM",          "SELINUX",  "ISCSI",    "AUDIT",          "FIB_LOOKUP", "CONNECTOR",
    "NETFILTER",     "IP6_FW",   "DNRTMSG",  "KOBJECT_UEVENT", "GENERIC",    nullptr,
    "SCSITRANSPORT", "ECRYPTFS", "RDMA",     "CRYPTO",         "SMC",
};

// Of the tables of all namespaces together.
constexpr size_t kMostText = size_t{256} << 20;

struct Socket {
  uint64_t inode;
  size_t line;    // place in the texts
  size_t length;  // of the line, without its newline
  uint8_t table;  // place in kTables
};

// Where the text of a table stands.
struct Piece {
  uint64_t number;  // of the namespace
  size_t begin;
  size_t end;
  uint8_t table;
};

// The sockets of all namespaces read so far. A process may hold sockets of other namespaces than
// its own (a service manager passes them on), and inode numbers are unique among all of them.
struct Sockets {
  Array<uint64_t> namespaces;  // inode numbers
  Bytes texts;                 // the tables, one behind the other
  Array<Piece> pieces;
  Array<Socket> byInode;
};

Everlasting<Sockets> snapshot;

// The name at `number` of a list; null where it has none.
template <size_t kCount>
const char *NameOf(const char *const (&names)[kCount], unsigned long number) {
  return number < kCount ? names[number] : nullptr;
}

// The blank-separated field `index` of a line. At the line's end: its newline or NUL.
const char *FieldOf(const char *line, unsigned index) {
  const char *place = line + strspn(line, " ");
  for (; index > 0; --index) {
    place += strcspn(place, " \n");
    place += strspn(place, " ");
  }
  return place;
}

unsigned long HexadecimalField(const char *line, unsigned index) {
  const char *field = FieldOf(line, index);
  return *field != '\n' ? strtoul(field, nullptr, 16) : 0;
}

KIF_Status IndexLines(size_t start, uint8_t table) {
  const char *texts = snapshot->texts.text();
  for (size_t line = start; line < snapshot->texts.size();) {
    const size_t rest = snapshot->texts.size() - line;
    const void *newline = memchr(texts + line, '\n', rest);
    const size_t length =
        newline != nullptr ? static_cast<size_t>(static_cast<const char *>(newline) - texts) - line
                           : rest;
    const char *field = FieldOf(texts + line, kTables[table].inodeField);
    uint64_t inode;
    // Sockets that no process holds any more, or not yet, have the number 0.
    if (TakeNumber(&field, &inode) && inode != 0 &&
        !snapshot->byInode.Append({inode, line, length, table})) {
      return KIF_STATUS_NO_MEMORY;
    }
    line += length + 1;
  }
  return KIF_STATUS_OK;
}

// Reads the table in the directory `net`. A kernel without the protocol has no such file.
KIF_Status ReadTable(int net, uint8_t table) {
  Descriptor file;
  KIF_Status status = OpenBelow(net, kTables[table].file, O_RDONLY, &file);
  if (status == KIF_STATUS_NO_RESOURCES || status == KIF_STATUS_NO_MEMORY) return status;
  if (status != KIF_STATUS_OK) return KIF_STATUS_OK;
  const size_t start = snapshot->texts.size();
  status = ReadWhole(file, &snapshot->texts, start < kMostText ? kMostText - start : 0);
  return status == KIF_STATUS_NO_MEMORY ? status : IndexLines(start, table);
}

// Number of the network namespace of a process. Trees made by hand need not say; all of their
// processes are then in one.
KIF_Status NamespaceOf(int process, uint64_t *number) {
  char text[64];
  const KIF_Status status = ReadLinkBelow(process, "ns/net", text, sizeof(text));
  *number = 0;
  if (status != KIF_STATUS_OK) return IsForeignRoot() ? KIF_STATUS_OK : status;
  const char *place = text + strcspn(text, "0123456789");
  TakeNumber(&place, number);
  return KIF_STATUS_OK;
}

KIF_Status OpenTables(int process, Descriptor *net) {
  const KIF_Status status = OpenBelow(process, "net", O_PATH | O_DIRECTORY, net);
  if (status == KIF_STATUS_OK || !IsForeignRoot()) return status;
  return OpenHostFile("/proc/net", O_PATH | O_DIRECTORY, net);
}

const Socket *FindSocket(uint64_t inode) {
  const Array<Socket> &known = snapshot->byInode;
  const Socket *found =
      std::lower_bound(known.begin(), known.end(), inode,
                       [](const Socket &socket, uint64_t wanted) { return socket.inode < wanted; });
  return found != known.end() && found->inode == inode ? found : nullptr;
}

// "0100007F:0016": the address as words in the machine's byte order, the port as a number.
bool ParseEndpoint(const char *field, Endpoint *endpoint) {
  constexpr size_t kWordDigits = 8;
  const size_t digits = strspn(field, "0123456789ABCDEFabcdef");
  if ((digits != kWordDigits && digits != 4 * kWordDigits) || field[digits] != ':') return false;
  endpoint->size = digits / 2;
  for (size_t i = 0; i < digits; i += kWordDigits) {
    char word[kWordDigits + 1] = {};
    memcpy(word, field + i, kWordDigits);
    const auto value = static_cast<uint32_t>(strtoul(word, nullptr, 16));
    memcpy(endpoint->address + i / 2, &value, sizeof(value));
  }
  endpoint->port = strtoul(field + digits + 1, nullptr, 16);
  // An IPv4 peer of an IPv6 socket is shown as what it is.
  static constexpr unsigned char kMapped[12] = {0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0xff, 0xff};
  if (endpoint->size == 16 && memcmp(endpoint->address, kMapped, sizeof(kMapped)) == 0) {
    memmove(endpoint->address, endpoint->address + sizeof(kMapped), 4);
    endpoint->size = 4;
  }
  return true;
}

bool HasAddress(const Endpoint &endpoint) {
  return std::any_of(endpoint.address, endpoint.address + endpoint.size,
                     [](unsigned char byte) { return byte != 0; });
}

// "[", an address, "]:", a port, NUL.
constexpr size_t kEndpointSize = INET6_ADDRSTRLEN + 16;

void FormatEndpoint(const Endpoint &endpoint, char *text) {
  char address[INET6_ADDRSTRLEN] = "*";
  char port[12] = "*";
  const bool isVersion6 = endpoint.size == 16;
  const bool hasAddress = HasAddress(endpoint);
  if (hasAddress) {
    inet_ntop(isVersion6 ? AF_INET6 : AF_INET, endpoint.address, address, sizeof(address));
  }
  if (endpoint.port != 0) {
    snprintf(port, sizeof(port), "%u", static_cast<unsigned>(endpoint.port & 0xffff));
  }
  const bool bracketed = isVersion6 && hasAddress;
  snprintf(text, kEndpointSize, bracketed ? "[%s]:%s" : "%s:%s", address, port);
}

bool FormatInternet(const Table &table, const char *line, char *text, size_t size) {
  Endpoint local;
  Endpoint remote;
  if (!ParseEndpoint(FieldOf(line, 1), &local) || !ParseEndpoint(FieldOf(line, 2), &remote)) {
    return false;
  }
  char from[kEndpointSize];
  char to[kEndpointSize] = "";
  FormatEndpoint(local, from);
  const bool isConnected = HasAddress(remote) || remote.port != 0;
  if (isConnected) FormatEndpoint(remote, to);
  const bool hasState = strncmp(table.protocol, "TCP", 3) == 0;
  const char *state = hasState ? NameOf(kTcpStates, HexadecimalField(line, 3)) : nullptr;
  snprintf(text, size, "%s %s%s%s%s%s%s", table.protocol, from, isConnected ? "->" : "", to,
           state != nullptr ? " (" : "", state != nullptr ? state : "",
           state != nullptr ? ")" : "");
  return true;
}

// "...: 0100007F:0016 00000000:0000 0A 00000000:00000001 00:00000000 00000000  1000  0 12345": the
// queues of what is sent and received, and a few fields on user and inode number.
bool ParseInternet(const Table &table, const char *line, InternetSocket *socket) {
  constexpr unsigned kLocal = 1, kRemote = 2, kState = 3, kQueues = 4, kUser = 7;
  const char *place = FieldOf(line, table.inodeField);
  if (!TakeNumber(&place, &socket->inode) ||
      !ParseEndpoint(FieldOf(line, kLocal), &socket->local) ||
      !ParseEndpoint(FieldOf(line, kRemote), &socket->remote)) {
    return false;
  }
  char *colon;
  socket->protocol = table.protocol;
  socket->state = NameOf(kTcpStates, HexadecimalField(line, kState));
  socket->sendQueue = static_cast<uint32_t>(strtoul(FieldOf(line, kQueues), &colon, 16));
  socket->receiveQueue = *colon == ':' ? static_cast<uint32_t>(strtoul(colon + 1, nullptr, 16)) : 0;
  socket->user = static_cast<uint32_t>(strtoul(FieldOf(line, kUser), nullptr, 10));
  return true;
}

// What a socket without a name is called, its inode number, is all that tells it from others.
void FormatUnix(const Socket &socket, const char *line, char *text, size_t size) {
  char unnamed[32];
  const char *name = FieldOf(line, 6);
  name += strspn(name, "0123456789");
  if (*name == ' ') ++name;
  size_t length = socket.length - static_cast<size_t>(name - line);
  if (length == 0) {
    snprintf(unnamed, sizeof(unnamed), "socket:[%llu]",
             static_cast<unsigned long long>(socket.inode));
    name = unnamed;
    length = strlen(unnamed);
  }
  const char *type = NameOf(kTypes, HexadecimalField(line, 4));
  const bool listens = (HexadecimalField(line, 3) & kAcceptsConnections) != 0;
  const char *state = listens ? "LISTEN" : NameOf(kUnixStates, HexadecimalField(line, 5));
  snprintf(text, size, "unix %.*s type=%s (%s)", static_cast<int>(std::min(length, size)), name,
           type != nullptr ? type : "?", state != nullptr ? state : "?");
}

void FormatNetlink(const char *line, char *text, size_t size) {
  const unsigned long number = strtoul(FieldOf(line, 1), nullptr, 10);
  const char *name = NameOf(kNetlinkProtocols, number);
  if (name != nullptr) {
    snprintf(text, size, "netlink %s", name);
  } else {
    snprintf(text, size, "netlink %lu", number);
  }
}

void FormatPacket(const char *line, char *text, size_t size) {
  const char *type = NameOf(kTypes, HexadecimalField(line, 2));
  snprintf(text, size, "packet protocol=0x%04lx type=%s", HexadecimalField(line, 3),
           type != nullptr ? type : "?");
}

// Takes the text of a namespace's tables, which stand behind one another, and all that is known
// from it, out of the others'.
void ForgetNamespace(uint64_t number) {
  Sockets &all = *snapshot;
  const auto isOf = [number](const Piece &piece) { return piece.number == number; };
  const Piece *first = std::find_if(all.pieces.begin(), all.pieces.end(), isOf);
  if (first == all.pieces.end()) return;
  const Piece *end = std::find_if_not(first, static_cast<const Piece *>(all.pieces.end()), isOf);
  const size_t from = first->begin;
  const size_t to = end[-1].end;
  memmove(all.texts.data() + from, all.texts.text() + to, all.texts.size() - to);
  all.texts.Truncate(all.texts.size() - (to - from));
  all.pieces.Truncate(static_cast<size_t>(
      std::remove_if(all.pieces.begin(), all.pieces.end(), isOf) - all.pieces.begin()));
  for (Piece &piece : all.pieces) {
    if (piece.begin < to) continue;
    piece.begin -= to - from;
    piece.end -= to - from;
  }
  const auto isIn = [from, to](const Socket &socket) {
    return socket.line >= from && socket.line < to;
  };
  all.byInode.Truncate(static_cast<size_t>(
      std::remove_if(all.byInode.begin(), all.byInode.end(), isIn) - all.byInode.begin()));
  for (Socket &socket : all.byInode) {
    if (socket.line >= to) socket.line -= to - from;
  }
  all.namespaces.Truncate(static_cast<size_t>(
      std::remove(all.namespaces.begin(), all.namespaces.end(), number) - all.namespaces.begin()));
}

}  // namespace

KIF_Status ReadSocketsOf(int process, bool again) {
  uint64_t number;
  if (NamespaceOf(process, &number) != KIF_STATUS_OK) return KIF_STATUS_OK;
  const Array<uint64_t> &known = snapshot->namespaces;
  if (std::find(known.begin(), known.end(), number) != known.end()) {
    if (!again) return KIF_STATUS_OK;
    ForgetNamespace(number);
  }
  Descriptor net;
  KIF_Status status = OpenTables(process, &net);
  if (status == KIF_STATUS_NO_RESOURCES) return status;
  if (status != KIF_STATUS_OK) return KIF_STATUS_OK;
  const size_t before = snapshot->byInode.size();
  const size_t piecesBefore = snapshot->pieces.size();
  for (uint8_t table = 0; status == KIF_STATUS_OK && table < std::size(kTables); ++table) {
    const size_t begin = snapshot->texts.size();
    status = ReadTable(net.fd(), table);
    const Piece piece = {number, begin, snapshot->texts.size(), table};
    if (!snapshot->pieces.Append(piece)) status = KIF_STATUS_NO_MEMORY;
  }
  // A process that ended meanwhile showed a part of them at most; the next one is asked.
  uint64_t still;
  if (NamespaceOf(process, &still) != KIF_STATUS_OK || still != number) {
    snapshot->byInode.Truncate(before);
    snapshot->pieces.Truncate(piecesBefore);
  } else if (!snapshot->namespaces.Append(number)) {
    status = KIF_STATUS_NO_MEMORY;
  }
  std::sort(snapshot->byInode.begin(), snapshot->byInode.end(),
            [](const Socket &a, const Socket &b) {
              if (a.inode != b.inode) return a.inode < b.inode;
              return a.table != b.table ? a.table < b.table : a.line < b.line;
            });
  return status;
}

SocketRow FindSocketRow(uint64_t inode) {
  const Socket *socket = FindSocket(inode);
  if (socket == nullptr) return SocketRow::kNone;
  const bool isUnix = kTables[socket->table].layout == Layout::kUnix;
  return isUnix ? SocketRow::kUnix : SocketRow::kOther;
}

bool IsUnixProtocol(const char *attribute) {
  return strncmp(attribute, "UNIX", 4) == 0;
}

bool HasTable(const char *attribute) {
  const auto isIt = [attribute](const Table &table) {
    return strcmp(table.attribute, attribute) == 0;
  };
  return IsUnixProtocol(attribute) || std::any_of(std::begin(kTables), std::end(kTables), isIt);
}

bool DescribeSocket(uint64_t inode, char *text, size_t size) {
  const Socket *socket = FindSocket(inode);
  if (socket == nullptr) return false;
  const Table &table = kTables[socket->table];
  const char *line = snapshot->texts.text() + socket->line;
  switch (table.layout) {
    case Layout::kInternet:
      return FormatInternet(table, line, text, size);
    case Layout::kUnix:
      FormatUnix(*socket, line, text, size);
      break;
    case Layout::kNetlink:
      FormatNetlink(line, text, size);
      break;
    case Layout::kPacket:
      FormatPacket(line, text, size);
      break;
  }
  return true;
}

KIF_Status ForEachInternetSocket(int process,
                                 KIF_Status (*give)(const InternetSocket &socket, void *context),
                                 void *context) {
  uint64_t number;
  KIF_Status status = NamespaceOf(process, &number);
  if (status == KIF_STATUS_OK) status = ReadSocketsOf(process);
  bool isThere = false;  // a table that was read has a heading at least
  for (const Piece &piece : snapshot->pieces) {
    const Table &table = kTables[piece.table];
    if (piece.number != number || table.layout != Layout::kInternet) continue;
    isThere = isThere || piece.end > piece.begin;
    const char *end = snapshot->texts.text() + piece.end;
    for (const char *line = snapshot->texts.text() + piece.begin; line < end;) {
      InternetSocket socket;
      if (status != KIF_STATUS_OK) return status;
      if (ParseInternet(table, line, &socket)) status = give(socket, context);
      line += strcspn(line, "\n") + 1;
    }
  }
  return status != KIF_STATUS_OK || isThere ? status : KIF_STATUS_NOT_FOUND;
}
