#include "memory.h"

#include <unistd.h>

#include <new>

void EndWhenOutOfMemory() {
  std::set_new_handler([] {
    constexpr char kMessage[] = "kifcache: out of memory\n";
    (void)!write(STDERR_FILENO, kMessage, sizeof(kMessage) - 1);
    _exit(1);
  });
}
