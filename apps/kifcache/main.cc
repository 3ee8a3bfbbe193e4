// kifcache: makes, shows and checks the files that hold a recorded host.
#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <unistd.h>

#include <cstring>
#include <string>
#include <string_view>

#include "cache_file.h"
#include "cache_writer.h"
#include "check.h"
#include "host_model.h"
#include "json_writer.h"
#include "memory.h"
#include "node_table.h"
#include "recorder.h"
#include "status.h"
#include "text_reader.h"
#include "text_writer.h"

namespace {

constexpr char kUsage[] =
    "usage: kifcache COMMAND\n"
    "  record [--redact] FILE  save this host into FILE; with --redact without the arguments\n"
    "                          of command lines and the values of boot options\n"
    "  check FILE              verify FILE and tell what is in it\n"
    "  dump [--json] FILE      print what FILE holds as text, or as JSON Lines\n"
    "  build TEXT FILE         make FILE from the text that dump prints; - is standard input\n"
    "  nodes                   list the nodes and the named fields of their records\n"
    "  --help, --version\n";

class OpenFile {
 public:
  explicit OpenFile(const char *path) : status_(OpenCacheFile(path, &file_)) {
    if (status_ != 0) {
      fprintf(stderr, "kifcache: %s: %s\n", path, ZLK_ReturnStatusToString(status_));
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
  if (count < 0) fprintf(stderr, "kifcache: %s: %s\n", path, strerror(error));
  return count == 0;
}

bool Record(const char *path, bool redact) {
  HostModel model;
  const RecordOptions options = {redact, isatty(STDERR_FILENO) == 1};
  return RecordHost(options, &model) && WriteCacheFile(model, path);
}

bool Check(const char *path) {
  const OpenFile open(path);
  return open.isOpen() && CheckFile(path, open.file(), stdout);
}

bool Dump(const char *path, bool asJson) {
  const OpenFile open(path);
  if (!open.isOpen()) return false;
  TextWriter textWriter(stdout);
  JsonWriter jsonWriter(stdout);
  Visitor *writer = asJson ? static_cast<Visitor *>(&jsonWriter) : &textWriter;
  std::string problem;
  if (VisitAll(open.file(), writer, &problem)) return true;
  fprintf(stderr, "kifcache: %s: %s\n", path,
          ZLK_ReturnStatusToString(KIF_STATUS_DAMAGED_CACHE_FILE));
  return false;
}

bool Build(const char *textPath, const char *path) {
  std::string text;
  if (!ReadFile(textPath, &text)) return false;
  HostModel model;
  const char *name = strcmp(textPath, "-") == 0 ? "(standard input)" : textPath;
  return ReadText(text, name, &model) && WriteCacheFile(model, path);
}

bool Fail(const char *usage) {
  fputs(usage, stderr);
  return false;
}

bool Run(int argc, char **argv) {
  const std::string_view command = argc > 1 ? argv[1] : "";
  const std::string_view option = argc > 2 ? argv[2] : "";
  if (command == "record") {
    const bool redact = option == "--redact";
    if (argc == (redact ? 4 : 3)) return Record(argv[argc - 1], redact);
  } else if (command == "check" && argc == 3) {
    return Check(argv[2]);
  } else if (command == "dump") {
    const bool asJson = option == "--json";
    if (argc == (asJson ? 4 : 3)) return Dump(argv[argc - 1], asJson);
  } else if (command == "build" && argc == 4) {
    return Build(argv[2], argv[3]);
  } else if (command == "nodes" && argc == 2) {
    PrintNodes(stdout);
    return true;
  } else if (command == "--help" && argc == 2) {
    fputs(kUsage, stdout);
    return true;
  } else if (command == "--version" && argc == 2) {
    puts("kifcache " KIFCACHE_VERSION);
    return true;
  }
  return Fail(kUsage);
}

}  // namespace

int main(int argc, char **argv) {
  EndWhenOutOfMemory();
  const bool done = Run(argc, argv);
  const bool failedBefore = ferror(stdout) != 0;
  if (fflush(stdout) == 0 && !failedBefore) return done ? 0 : 1;
  if (errno != EPIPE) fprintf(stderr, "kifcache: write error: %s\n", strerror(errno));
  return 1;
}
