// Any bytes as a table of /proc/net: the input's first byte names the table. Every socket in it is
// described. The tables of a namespace are read once in a process, so this reaches behind them.
#include "linux/sockets.cc"

#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include <string>

namespace {

std::string folder = "/dev/shm/sockets_fuzz.XXXXXX";
int process;

void Forget() {
  sockets->namespaces.Clear();
  sockets->texts.Clear();
  sockets->byInode.Clear();
}

void WriteTable(const std::string &name, const uint8_t *bytes, size_t size) {
  const int file =
      open((folder + "/net/" + name).c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
  if (file == -1 || write(file, bytes, size) != static_cast<ssize_t>(size)) abort();
  close(file);
}

void RemoveFolder() {
  for (const Table &table : kTables) unlink((folder + "/net/" + table.file).c_str());
  unlink((folder + "/ns/net").c_str());
  for (const char *name : {"/net", "/ns", ""}) rmdir((folder + name).c_str());
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int *, char ***) {
  if (mkdtemp(folder.data()) == nullptr) return 1;
  atexit(RemoveFolder);
  for (const char *name : {"/net", "/ns"}) {
    if (mkdir((folder + name).c_str(), 0700) != 0) return 1;
  }
  if (symlink("net:[1]", (folder + "/ns/net").c_str()) != 0) return 1;
  process = open(folder.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC);
  return process == -1 ? 1 : 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  if (size == 0 || data[0] < 'a' || data[0] >= 'a' + std::size(kTables)) return -1;
  const Table &table = kTables[data[0] - 'a'];
  WriteTable(table.file, data + 1, size - 1);
  Forget();
  if (ReadSocketsOf(process) != 0) abort();
  WriteTable(table.file, nullptr, 0);
  for (const Socket &socket : sockets->byInode) {
    char text[64];
    memset(text, 'x', sizeof(text));
    if (DescribeSocket(socket.inode, text, sizeof(text)) && strnlen(text, sizeof(text)) == 64) {
      abort();
    }
  }
  return 0;
}
