// What the sockets of the machine are, by inode number: the tables of /proc/net, each network
// namespace's read once.
#pragma once

#include <cstddef>
#include <cstdint>

#include "zellibs.h"

// Makes the sockets of a process's network namespace known, as far as they can be read; `again`
// reads those that are known anew. `process` is its open directory. Fails only for want of memory
// or descriptors.
KIF_Status ReadSocketsOf(int process, bool again = false);

// Which tables have a socket with an inode number. Everyone may give a unix socket a name that
// looks like a row of the table, so that a row there alone proves nothing.
enum class SocketRow : uint8_t { kNone, kUnix, kOther };
SocketRow FindSocketRow(uint64_t inode);

// Whether the protocol that a socket's attribute system.sockprotoname names is that of unix
// sockets, and whether it is one that has a table.
bool IsUnixProtocol(const char *attribute);
bool HasTable(const char *attribute);

// Writes protocol, addresses and state of a known socket, as numbers, to `text` (`size` bytes,
// terminated): "TCP 127.0.0.1:22->10.0.0.1:5555 (ESTABLISHED)". False where the tables have none
// with this inode number; `text` is then as it was.
bool DescribeSocket(uint64_t inode, char *text, size_t size);

struct Endpoint {
  unsigned char address[16];
  size_t size;  // of the address: 4 or 16
  unsigned long port;
};

// A row of an internet protocol's table.
struct InternetSocket {
  const char *protocol;
  const char *state;  // null where it is none that is known
  uint64_t inode;     // 0: no process holds it any more, or yet
  uint32_t sendQueue;
  uint32_t receiveQueue;
  uint32_t user;
  Endpoint local;
  Endpoint remote;
};

// Gives the sockets of the internet protocols in a process's network namespace, read anew unless
// they are known, in the kernel's order, until `give` gives a status. Not found where there is none
// of the tables.
KIF_Status ForEachInternetSocket(int process,
                                 KIF_Status (*give)(const InternetSocket &socket, void *context),
                                 void *context);
