// kifcache: makes, shows and checks the files that hold a recorded host.
#include <errno.h>
#include <fcntl.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <unistd.h>

#include <cinttypes>
#include <cstring>
#include <new>
#include <string>

#include "cache_writer.h"
#include "check.h"
#include "command_line.h"
#include "file_model.h"
#include "host_model.h"
#include "input.h"
#include "json_writer.h"
#include "messages.h"
#include "node_table.h"
#include "output.h"
#include "recorder.h"
#include "redact.h"
#include "status.h"
#include "text_reader.h"
#include "text_writer.h"

namespace {

constexpr Option kRedact = {
    "redact", nullptr,
    "keep only numbers, names of worlds, modules and devices, and what kifcache(1) lists"};
constexpr Option kName = {"name", "TEXT", "the name of a redacted host, in place of \"redacted\""};
constexpr Option kVerbose = {"verbose", nullptr, "and how many answers there are of every node"};
constexpr Option kJson = {"json", nullptr, "as JSON Lines"};

// Another user may see more.
void AdviseOnRights(const Facts &facts) {
  uint64_t refused = 0;
  for (const Lack &lack : facts.lacks) {
    if (lack.reason == cache::Reason::Rights) refused += lack.count;
  }
  if (refused == 0 || geteuid() == 0) return;
  fprintf(stderr, "kifcache: %" PRIu64 " answers were refused: run as root for a whole picture\n",
          refused);
}

// The name that a redacted host gets; empty where none is given.
std::string NameGiven(const Arguments &given) {
  return given.Has(kName) ? given.Of(kName) : "";
}

int Record(const Arguments &given) {
  const char *path = given.operands[0];
  if (given.Has(kName) && !given.Has(kRedact)) {
    Complain("record", "--name is the name of a redacted host: add --redact");
    return 1;
  }
  HostModel model;
  if (!MayWriteRecording(path) || !RecordHost(&model)) return 1;
  if (given.Has(kRedact)) RedactModel(NameGiven(given), &model);
  if (!WriteCacheFile(model, path)) return 1;
  AdviseOnRights(model.facts);
  return 0;
}

int Check(const Arguments &given) {
  const char *path = given.operands[0];
  const InputRecording input(path);
  if (!input.isOpen()) return 1;
  return CheckFile(InputName(path), input.file(), given.Has(kVerbose), stdout) ? 0 : 1;
}

int Dump(const Arguments &given) {
  const char *path = given.operands[0];
  const InputRecording input(path);
  if (!input.isOpen()) return 1;
  TextWriter textWriter(stdout);
  JsonWriter jsonWriter(stdout);
  Visitor *writer = given.Has(kJson) ? static_cast<Visitor *>(&jsonWriter) : &textWriter;
  std::string problem;
  if (VisitAll(input.file(), writer, &problem)) return 0;
  Complain(InputName(path), ZLK_ReturnStatusToString(KIF_STATUS_DAMAGED_CACHE_FILE));
  return 1;
}

int Build(const Arguments &given) {
  const char *textPath = given.operands[0];
  const char *path = given.operands[1];
  InputText input;
  if (!MayWriteRecording(path) || !input.Read(textPath)) return 1;
  HostModel model;
  const char *name = IsStandardStream(textPath) ? "(standard input)" : textPath;
  return ReadText(input.text(), name, &model) && WriteCacheFile(model, path) ? 0 : 1;
}

int Redact(const Arguments &given) {
  const char *path = given.operands[1];
  if (!MayWriteRecording(path)) return 1;
  const InputRecording input(given.operands[0]);
  HostModel model;
  if (!input.isOpen() || !ReadKnown(InputName(given.operands[0]), input.file(), &model)) return 1;
  RedactModel(NameGiven(given), &model);
  return WriteCacheFile(model, path) ? 0 : 1;
}

int Nodes(const Arguments &) {
  PrintNodes(stdout);
  return 0;
}

// A file that is opened must not take the place of a closed standard stream and get its output.
void OccupyStandardStreams() {
  for (int stream = STDIN_FILENO; stream <= STDERR_FILENO; ++stream) {
    if (fcntl(stream, F_GETFD) == -1) (void)open("/", O_PATH | O_CLOEXEC);
  }
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
    {"record", "FILE", "save this host into FILE", Record, {&kRedact, &kName}},
    {"check", "FILE", "verify FILE and tell what is in it", Check, {&kVerbose}},
    {"dump", "FILE", "print what FILE holds as text", Dump, {&kJson}},
    {"build", "TEXT FILE", "make FILE from the text that dump prints", Build, {}},
    {"redact",
     "IN OUT",
     "make OUT from the recording IN as record --redact does",
     Redact,
     {&kName}},
    {"nodes", "", "list the nodes and the named fields of their records", Nodes, {}},
    {},
};

int main(int argc, char **argv) {
  EndWhenOutOfMemory();
  OccupyStandardStreams();
  signal(SIGXFSZ, SIG_IGN);  // a file size limit is an error like a full disk
  const bool asksVersion = argc == 2 && strcmp(argv[1], "--version") == 0;
  const int status = asksVersion ? Version() : RunCommandLine(argc, argv);
  const bool failedBefore = ferror(stdout) != 0;
  if (fflush(stdout) == 0 && !failedBefore) return status;
  if (errno != EPIPE) fprintf(stderr, "kifcache: write error: %s\n", strerror(errno));
  return status != 0 ? status : 1;
}
