// What the sockets of the machine are, by inode number: the tables of /proc/net, each network
// namespace's read once.
#pragma once

#include <cstddef>
#include <cstdint>

#include "zellibs.h"

// Makes the sockets of a process's network namespace known, as far as they can be read. `process`
// is its open directory. Fails only for want of memory or descriptors.
KIF_Status ReadSocketsOf(int process);

// Writes protocol, addresses and state of a known socket, as numbers, to `text` (`size` bytes,
// terminated): "TCP 127.0.0.1:22->10.0.0.1:5555 (ESTABLISHED)". False where the tables have none
// with this inode number; `text` is then as it was.
bool DescribeSocket(uint64_t inode, char *text, size_t size);
