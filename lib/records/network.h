// The records of the network, which recordings alone have (see worlds.h). Its namespaces are known
// by a number: 1 is the recorder's, the others have that of their inode. Addresses stand in their
// standard text form.
#pragma once

#include <stdint.h>

// Node network_namespaces, for a namespace.
struct __attribute__((packed)) NetworkNamespace {
  uint64_t known;
  uint64_t device;
  uint64_t inode;
  uint32_t process;  // the first one that is in it
  uint8_t isRecorders;
};

// Node network_interfaces, for a namespace and an interface's index; where the index is not known,
// -1, -2 and so on.
struct __attribute__((packed)) NetworkInterface {
  uint64_t known;
  uint32_t number;  // the index
  uint32_t flags;   // IFF_UP and so on
  uint32_t mtu;
  uint32_t speed;   // in Mbit/s
  uint32_t master;  // index of the bridge, bond and the like that it belongs to; 0 none
  uint8_t carrier;
  uint64_t receivedBytes;
  uint64_t receivedPackets;
  uint64_t receiveErrors;
  uint64_t receiveDrops;
  uint64_t sentBytes;
  uint64_t sentPackets;
  uint64_t sendErrors;
  uint64_t sendDrops;
  char name[16];
  char kind[32];  // what made it, "bridge", or the kind of its medium, "ether"
  char driver[32];
  char pciFunction[16];  // the one that it stands behind
  char address[96];      // of the medium
};

// Node network_addresses, for a namespace and a place. Lifetimes are in seconds, UINT32_MAX never
// ends.
struct __attribute__((packed)) NetworkAddress {
  uint64_t known;
  uint32_t number;  // of the interface
  uint32_t flags;   // IFA_F_PERMANENT and so on
  uint32_t validTime;
  uint32_t preferredTime;
  uint8_t prefixLength;
  char family[8];  // "inet" or "inet6"
  char scope[16];
  char address[48];
  char peer[48];
};

// Node network_routes, for a namespace and a place: one for each way of a route that has several.
struct __attribute__((packed)) NetworkRoute {
  uint64_t known;
  uint32_t routeTable;
  uint32_t metric;
  uint32_t number;  // of the interface
  uint8_t service;
  uint8_t prefixLength;
  char family[8];
  char type[16];
  char scope[16];
  char protocol[16];
  char destination[48];
  char gateway[48];
  char preferredSource[48];
};

// Node network_sockets, for a namespace and a place: those of the internet protocols.
struct __attribute__((packed)) NetworkSocket {
  uint64_t known;
  uint64_t inode;         // 0: no process holds it any more, or yet
  uint32_t sendQueue;     // in bytes, as the next one
  uint32_t receiveQueue;  // of a listening one the connections that wait
  uint32_t user;
  uint32_t cartelCount;
  uint16_t localPort;
  uint16_t remotePort;
  char protocol[12];
  char state[16];
  char localAddress[48];
  char remoteAddress[48];
  char cartels[256];  // those that hold it, "7,12", as many as there is room for
};

// Node network_counters, for a namespace and a counter's row and name, "Tcp.RetransSegs".
struct __attribute__((packed)) NetworkCounter {
  uint64_t known;
  int64_t value;
};
