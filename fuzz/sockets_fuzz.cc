// Any bytes as a table of /proc/net: the input's first byte names the table. Every socket in it is
// described. The tables of a namespace are read once in a process, so this reaches behind them.
#include "linux/sockets.cc"

#include "surroundings.h"

namespace {

const int process = [] {
  std::filesystem::create_directory(folder + "/ns");
  if (symlink("net:[1]", (folder + "/ns/net").c_str()) != 0) abort();
  return open(folder.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC);
}();

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  if (size == 0 || data[0] < 'a' || data[0] >= 'a' + std::size(kTables)) return -1;
  const Table &table = kTables[data[0] - 'a'];
  const std::string file = std::string("/net/") + table.file;
  Write(file, data + 1, size - 1);
  snapshot->namespaces.Clear();
  snapshot->texts.Clear();
  snapshot->byInode.Clear();
  if (ReadSocketsOf(process) != 0) abort();
  Write(file, nullptr, 0);
  for (const Socket &socket : snapshot->byInode) {
    char text[64];
    memset(text, 'x', sizeof(text));
    if (DescribeSocket(socket.inode, text, sizeof(text)) && strnlen(text, sizeof(text)) == 64) {
      abort();
    }
  }
  return 0;
}
