// Which cartels hold which sockets. What a reader of descriptors comes by is kept, so that the
// descriptors of most processes are read once.
#pragma once

#include <cstddef>
#include <cstdint>

#include "zellibs.h"

// The descriptors of a process were listed, and are now read one by one.
KIF_Status NoteDescriptorsOf(int64_t process);

// A process has a descriptor of the socket; or its descriptors may not be read.
KIF_Status NoteHolder(int64_t process, uint64_t inode);
void NoteRefusal();

// Reads the descriptors of the cartels that nobody has listed.
KIF_Status ReadRemainingHolders();

struct SocketHolder {
  uint64_t inode;
  int32_t process;
};

// The holders of a socket, each once, ascending, after ReadRemainingHolders. `*certain`: there are
// no others.
void FindHolders(uint64_t inode, const SocketHolder **first, const SocketHolder **end,
                 bool *certain);
