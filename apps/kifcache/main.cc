// kifcache: makes, shows and checks the files that hold a recorded host.
#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <unistd.h>

#include <cstring>
#include <new>
#include <string>

#include "cache_file.h"
#include "cache_writer.h"
#include "check.h"
#include "command_line.h"
#include "host_model.h"
#include "json_writer.h"
#include "messages.h"
#include "node_table.h"
#include "recorder.h"
#include "status.h"
#include "text_reader.h"
#include "text_writer.h"

namespace {

class OpenFile {
 public:
  explicit OpenFile(const char *path) : status_(OpenCacheFile(path, &file_)) {
    if (status_ != 0) {
      Complain(path, ZLK_ReturnStatusToString(status_));
    }
  }
  ~OpenFile() { CloseCacheFile(&file_); }
  OpenFile(const OpenFile &) = delete;
  OpenFile &operator=(const OpenFile &) = delete;

  bool isOpen() const { return status_ == 0; }
  const CacheFile &file() const { return file_; }

 private:
  CacheFile file_ = {};
  KIF_Status status_;
};

// Reads the whole file, or standard input for "-".
bool ReadFile(const char *path, std::string *bytes) {
  const bool isInput = strcmp(path, "-") == 0;
  const int descriptor = isInput ? STDIN_FILENO : open(path, O_RDONLY | O_CLOEXEC);
  int error = errno;
  ssize_t count = descriptor == -1 ? -1 : 1;
  while (count > 0) {
    char block[1 << 16];
    count = read(descriptor, block, sizeof(block));
    error = errno;
    if (count > 0) bytes->append(block, static_cast<size_t>(count));
  }
  if (!isInput && descriptor != -1) close(descriptor);
  if (count < 0) Complain(path, strerror(error));
  return count == 0;
}

constexpr Option kRedact = {
    "redact", nullptr, "without the arguments of command lines and the values of boot options"};
constexpr Option kJson = {"json", nullptr, "as JSON Lines"};

int Record(const Arguments &given) {
  HostModel model;
  const RecordOptions options = {given.Has(kRedact), isatty(STDERR_FILENO) == 1};
  return RecordHost(options, &model) && WriteCacheFile(model, given.operands[0]) ? 0 : 1;
}

int Check(const Arguments &given) {
  const OpenFile open(given.operands[0]);
  return open.isOpen() && CheckFile(given.operands[0], open.file(), stdout) ? 0 : 1;
}

int Dump(const Arguments &given) {
  const char *path = given.operands[0];
  const OpenFile open(path);
  if (!open.isOpen()) return 1;
  TextWriter textWriter(stdout);
  JsonWriter jsonWriter(stdout);
  Visitor *writer = given.Has(kJson) ? static_cast<Visitor *>(&jsonWriter) : &textWriter;
  std::string problem;
  if (VisitAll(open.file(), writer, &problem)) return 0;
  Complain(path, ZLK_ReturnStatusToString(KIF_STATUS_DAMAGED_CACHE_FILE));
  return 1;
}

int Build(const Arguments &given) {
  const char *textPath = given.operands[0];
  std::string text;
  if (!ReadFile(textPath, &text)) return 1;
  HostModel model;
  const char *name = strcmp(textPath, "-") == 0 ? "(standard input)" : textPath;
  return ReadText(text, name, &model) && WriteCacheFile(model, given.operands[1]) ? 0 : 1;
}

int Nodes(const Arguments &) {
  PrintNodes(stdout);
  return 0;
}

int Version() {
  const char *libraryDate = "unknown";
  (void)KIF_CheckSig(nullptr, 0, &libraryDate);
  printf("kifcache " KIFCACHE_VERSION "\nlibrary of %s\n", libraryDate);
  printf("writes file format %d.%d, reads %d.0 and every later %d.x\n", kCacheMajorVersion,
         kCacheMinorVersion, kCacheMajorVersion, kCacheMajorVersion);
  return 0;
}

// Makes every allocation that fails end the process with a message and status 1.
void EndWhenOutOfMemory() {
  std::set_new_handler([] {
    constexpr char kMessage[] = "kifcache: out of memory\n";
    (void)!write(STDERR_FILENO, kMessage, sizeof(kMessage) - 1);
    _exit(1);
  });
}

}  // namespace

const Command kCommands[] = {
    {"record", "FILE", "save this host into FILE", Record, {&kRedact}},
    {"check", "FILE", "verify FILE and tell what is in it", Check, {}},
    {"dump", "FILE", "print what FILE holds as text", Dump, {&kJson}},
    {"build", "TEXT FILE", "make FILE from the text that dump prints", Build, {}},
    {"nodes", "", "list the nodes and the named fields of their records", Nodes, {}},
    {},
};

int main(int argc, char **argv) {
  EndWhenOutOfMemory();
  const bool asksVersion = argc == 2 && strcmp(argv[1], "--version") == 0;
  const int status = asksVersion ? Version() : RunCommandLine(argc, argv);
  const bool failedBefore = ferror(stdout) != 0;
  if (fflush(stdout) == 0 && !failedBefore) return status;
  if (errno != EPIPE) fprintf(stderr, "kifcache: write error: %s\n", strerror(errno));
  return status != 0 ? status : 1;
}
