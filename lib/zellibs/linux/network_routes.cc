// network_addresses and network_routes: what rtnetlink tells of the reader's namespace.
#include <arpa/inet.h>
#include <stdio.h>

#include <algorithm>
#include <cstring>

#include "base/array.h"
#include "base/everlasting.h"
#include "linux/attributes.h"
#include "linux/linux_nodes.h"
#include "linux/netlink_dump.h"
#include "linux/network_namespaces.h"
#include "records/network.h"

namespace {

// The places of the fields behind `known`.
enum AddressField : unsigned {
  kNumber,
  kFlags,
  kValidTime,
  kPreferredTime,
  kPrefixLength,
  kFamily,
  kScope,
  kAddress,
  kPeer
};
enum RouteField : unsigned {
  kRouteTable,
  kMetric,
  kRouteNumber,
  kService,
  kRoutePrefixLength,
  kRouteFamily,
  kType,
  kRouteScope,
  kProtocol,
  kDestination,
  kGateway,
  kPreferredSource
};

struct IpAddress {
  uint8_t family;  // 0: none
  unsigned char bytes[16];
};

struct Address {
  ifaddrmsg head;
  uint32_t flags;
  bool hasTimes;
  ifa_cacheinfo times;
  IpAddress local;
  IpAddress peer;
};

struct Route {
  rtmsg head;
  uint32_t table;
  uint32_t metric;
  uint32_t interface;  // 0: none
  IpAddress destination;
  IpAddress gateway;
  IpAddress source;
};

// What was listed last, in the kernel's order; the number of each is its place, from 1.
template <typename Item>
struct Listed {
  bool read = false;
  Array<Item> all;
};

Everlasting<Listed<Address>> addresses;
Everlasting<Listed<Route>> routes;

// Numbers that the kernel gives, and iproute2's names for them.
struct Name {
  unsigned number;
  const char *text;
};
constexpr Name kScopes[] = {
    {RT_SCOPE_UNIVERSE, "global"}, {RT_SCOPE_SITE, "site"},       {RT_SCOPE_LINK, "link"},
    {RT_SCOPE_HOST, "host"},       {RT_SCOPE_NOWHERE, "nowhere"},
};
constexpr Name kTypes[] = {
    {RTN_UNICAST, "unicast"},
    {RTN_LOCAL, "local"},
    {RTN_BROADCAST, "broadcast"},
    {RTN_ANYCAST, "anycast"},
    {RTN_MULTICAST, "multicast"},
    {RTN_BLACKHOLE, "blackhole"},
    {RTN_UNREACHABLE, "unreachable"},
    {RTN_PROHIBIT, "prohibit"},
    {RTN_THROW, "throw"},
    {RTN_NAT, "nat"},
};
constexpr Name kProtocols[] = {
    {RTPROT_UNSPEC, "unspec"}, {RTPROT_REDIRECT, "redirect"}, {RTPROT_KERNEL, "kernel"},
    {RTPROT_BOOT, "boot"},     {RTPROT_STATIC, "static"},     {RTPROT_RA, "ra"},
    {RTPROT_ZEBRA, "zebra"},   {RTPROT_BIRD, "bird"},         {RTPROT_DHCP, "dhcp"},
    {RTPROT_BGP, "bgp"},       {RTPROT_ISIS, "isis"},         {RTPROT_OSPF, "ospf"},
    {RTPROT_RIP, "rip"},
};

template <size_t kCount, size_t kSize>
void PutName(const Name (&names)[kCount], unsigned number, char (&field)[kSize]) {
  for (const Name &name : names) {
    if (name.number == number) {
      snprintf(field, kSize, "%s", name.text);
      return;
    }
  }
  snprintf(field, kSize, "%u", number);
}

size_t SizeOf(uint8_t family) {
  return family == AF_INET ? 4 : family == AF_INET6 ? 16 : 0;
}

IpAddress TakeAddress(uint8_t family, const char *bytes, size_t size) {
  IpAddress address = {};
  if (SizeOf(family) == 0 || size != SizeOf(family)) return address;
  address.family = family;
  memcpy(address.bytes, bytes, size);
  return address;
}

// False where there is none.
template <size_t kSize>
bool PutAddress(const IpAddress &address, char (&field)[kSize]) {
  static_assert(kSize >= INET6_ADDRSTRLEN);
  return address.family != 0 && inet_ntop(address.family, address.bytes, field, kSize) != nullptr;
}

template <size_t kSize>
void PutFamily(uint8_t family, char (&field)[kSize]) {
  snprintf(field, kSize, "%s", family == AF_INET ? "inet" : "inet6");
}

uint32_t NumberIn(const char *bytes, size_t size) {
  uint32_t number = 0;
  memcpy(&number, bytes, std::min(size, sizeof(number)));
  return number;
}

KIF_Status TakeAddressMessage(const ifaddrmsg &head, const char *attributes, size_t size) {
  if (SizeOf(head.ifa_family) == 0) return KIF_STATUS_OK;
  Address address = {head, head.ifa_flags, false, {}, {}, {}};
  IpAddress far = {};
  ForEachAttribute(attributes, size, [&](unsigned type, const char *bytes, size_t length) {
    if (type == IFA_LOCAL) address.local = TakeAddress(head.ifa_family, bytes, length);
    if (type == IFA_ADDRESS) far = TakeAddress(head.ifa_family, bytes, length);
    if (type == IFA_FLAGS) address.flags = NumberIn(bytes, length);
    if (type == IFA_CACHEINFO && length >= sizeof(address.times)) {
      memcpy(&address.times, bytes, sizeof(address.times));
      address.hasTimes = true;
    }
  });
  // Where both are told and differ, the second one is the peer's.
  if (address.local.family == 0) {
    address.local = far;
  } else if (memcmp(far.bytes, address.local.bytes, sizeof(far.bytes)) != 0) {
    address.peer = far;
  }
  return addresses->all.Append(address) ? KIF_STATUS_OK : KIF_STATUS_NO_MEMORY;
}

// RTA_VIA: a gateway of another family.
IpAddress TakeVia(const char *bytes, size_t size) {
  uint16_t family = 0;
  if (size < sizeof(family)) return {};
  memcpy(&family, bytes, sizeof(family));
  return TakeAddress(static_cast<uint8_t>(family), bytes + sizeof(family), size - sizeof(family));
}

void TakeRouteAttribute(unsigned type, const char *bytes, size_t size, Route *route) {
  const uint8_t family = route->head.rtm_family;
  switch (type) {
    case RTA_DST:
      route->destination = TakeAddress(family, bytes, size);
      break;
    case RTA_GATEWAY:
      route->gateway = TakeAddress(family, bytes, size);
      break;
    case RTA_VIA:
      route->gateway = TakeVia(bytes, size);
      break;
    case RTA_PREFSRC:
      route->source = TakeAddress(family, bytes, size);
      break;
    case RTA_OIF:
      route->interface = NumberIn(bytes, size);
      break;
    case RTA_TABLE:
      route->table = NumberIn(bytes, size);
      break;
    case RTA_PRIORITY:
      route->metric = NumberIn(bytes, size);
      break;
    default:
      break;
  }
}

// One for each of the ways of a route.
KIF_Status AppendWays(const Route &route, const char *place, size_t left) {
  while (left >= sizeof(rtnexthop)) {
    rtnexthop way;
    memcpy(&way, place, sizeof(way));
    if (way.rtnh_len < sizeof(way) || way.rtnh_len > left) break;
    Route one = route;
    one.interface = static_cast<uint32_t>(way.rtnh_ifindex);
    ForEachAttribute(place + sizeof(way), way.rtnh_len - sizeof(way),
                     [&](unsigned type, const char *bytes, size_t size) {
                       TakeRouteAttribute(type, bytes, size, &one);
                     });
    if (!routes->all.Append(one)) return KIF_STATUS_NO_MEMORY;
    const size_t step = RTNH_ALIGN(way.rtnh_len);
    if (step >= left) break;
    place += step;
    left -= step;
  }
  return KIF_STATUS_OK;
}

KIF_Status TakeRouteMessage(const rtmsg &head, const char *attributes, size_t size) {
  if (SizeOf(head.rtm_family) == 0 || (head.rtm_flags & RTM_F_CLONED) != 0) return KIF_STATUS_OK;
  Route route = {head, head.rtm_table, 0, 0, {}, {}, {}};
  route.destination.family = head.rtm_family;  // all zeros where none is told
  const char *ways = nullptr;
  size_t waysSize = 0;
  ForEachAttribute(attributes, size, [&](unsigned type, const char *bytes, size_t length) {
    TakeRouteAttribute(type, bytes, length, &route);
    if (type == RTA_MULTIPATH) ways = bytes;
    if (type == RTA_MULTIPATH) waysSize = length;
  });
  if (ways != nullptr) return AppendWays(route, ways, waysSize);
  return routes->all.Append(route) ? KIF_STATUS_OK : KIF_STATUS_NO_MEMORY;
}

template <typename Body, typename Item, typename Take>
KIF_Status Read(int64_t network, uint16_t ask, uint16_t told, Listed<Item> *listed, Take take) {
  listed->read = false;
  listed->all.Clear();
  if (network != kOwnNetwork) return KIF_STATUS_NOT_FOUND;
  Bytes answers;
  KIF_Status status = DumpNetlink(ask, &answers);
  if (status == KIF_STATUS_OK) status = ForEachMessage<Body>(answers, told, take);
  listed->read = status == KIF_STATUS_OK;
  return status;
}

KIF_Status ReadAddresses(int64_t network) {
  return Read<ifaddrmsg>(network, RTM_GETADDR, RTM_NEWADDR, &*addresses, TakeAddressMessage);
}

KIF_Status ReadRoutes(int64_t network) {
  return Read<rtmsg>(network, RTM_GETROUTE, RTM_NEWROUTE, &*routes, TakeRouteMessage);
}

KIF_Status ListNumbers(size_t count, KIF_ParamList *list) {
  KIF_Status status = KIF_STATUS_OK;
  for (size_t i = 1; status == KIF_STATUS_OK && i <= count; ++i) {
    status = KIF_ParamListAddInt(list, static_cast<int64_t>(i));
  }
  return status;
}

template <typename Item>
KIF_Status FindItem(const KIF_ParamList *instance, KIF_Status (*read)(int64_t network),
                    const Listed<Item> &listed, const Item **item) {
  const int64_t number = Integer(instance, 1);
  if (Integer(instance, 0) != kOwnNetwork) return KIF_STATUS_NOT_FOUND;
  const KIF_Status status = listed.read ? KIF_STATUS_OK : read(kOwnNetwork);
  if (status != KIF_STATUS_OK) return status;
  if (number < 1 || static_cast<uint64_t>(number) > listed.all.size()) return KIF_STATUS_NOT_FOUND;
  *item = &listed.all[static_cast<size_t>(number) - 1];
  return KIF_STATUS_OK;
}

}  // namespace

KIF_Status ListAddresses(const NodeInfo &, const KIF_ParamList *parent, KIF_ParamList *list) {
  const KIF_Status status = ReadAddresses(Integer(parent, 0));
  return status == KIF_STATUS_OK ? ListNumbers(addresses->all.size(), list) : status;
}

KIF_Status GetAddress(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  const Address *address;
  const KIF_Status status = FindItem(instance, ReadAddresses, *addresses, &address);
  if (status != KIF_STATUS_OK) return status;
  auto *answer = static_cast<NetworkAddress *>(record);
  uint64_t known = 0;
  for (const unsigned field : {kNumber, kFlags, kPrefixLength, kFamily, kScope, kPeer}) {
    Know(&known, field, true);
  }
  answer->number = address->head.ifa_index;
  answer->flags = address->flags;
  answer->prefixLength = address->head.ifa_prefixlen;
  PutFamily(address->head.ifa_family, answer->family);
  PutName(kScopes, address->head.ifa_scope, answer->scope);
  if (address->hasTimes) {
    answer->validTime = address->times.ifa_valid;
    answer->preferredTime = address->times.ifa_prefered;
  }
  Know(&known, kValidTime, address->hasTimes);
  Know(&known, kPreferredTime, address->hasTimes);
  Know(&known, kAddress, PutAddress(address->local, answer->address));
  (void)PutAddress(address->peer, answer->peer);
  answer->known = known;
  return KIF_STATUS_OK;
}

KIF_Status ListRoutes(const NodeInfo &, const KIF_ParamList *parent, KIF_ParamList *list) {
  const KIF_Status status = ReadRoutes(Integer(parent, 0));
  return status == KIF_STATUS_OK ? ListNumbers(routes->all.size(), list) : status;
}

KIF_Status GetRoute(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  const Route *route;
  const KIF_Status status = FindItem(instance, ReadRoutes, *routes, &route);
  if (status != KIF_STATUS_OK) return status;
  auto *answer = static_cast<NetworkRoute *>(record);
  answer->routeTable = route->table;
  answer->metric = route->metric;
  answer->number = route->interface;
  answer->service = route->head.rtm_tos;
  answer->prefixLength = route->head.rtm_dst_len;
  PutFamily(route->head.rtm_family, answer->family);
  PutName(kTypes, route->head.rtm_type, answer->type);
  PutName(kScopes, route->head.rtm_scope, answer->scope);
  PutName(kProtocols, route->head.rtm_protocol, answer->protocol);
  (void)PutAddress(route->destination, answer->destination);
  (void)PutAddress(route->gateway, answer->gateway);
  (void)PutAddress(route->source, answer->preferredSource);
  // A route without a gateway or interface has none: that is known.
  answer->known = (uint64_t{2} << kPreferredSource) - 1;
  return KIF_STATUS_OK;
}
