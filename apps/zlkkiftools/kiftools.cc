// The dispatcher: chooses the tool, sets up live or cache access, and hands over.
#include "kiftools.h"

#include <fcntl.h>
#include <inttypes.h>
#include <stdarg.h>
#include <stdio.h>
#include <stdlib.h>
#include <unistd.h>

#include <string_view>

#include "output.h"
#include "tools.h"
#include "zellibs.h"

uint8_t InvokedWithCache = 0;

namespace {

constexpr std::string_view kProgramName = "zlkkiftools";

struct Tool {
  const char *name;
  int (*entry)(int argc, char **argv);
};

constexpr Tool ToolTable[] = {
    {"lspci", LspciEntry},     {"ps", PsEntry},
    {"hwclock", HwclockEntry}, {"zelvar", ZelvarEntry},
    {"irqinfo", IrqinfoEntry}, {"bootOption", BootOptionEntry},
    {"amldump", AmldumpEntry}, {"pci-info", PciInfoEntry},
    {"pidof", PidofEntry},     {"userspaceof", UserspaceofEntry},
    {"mdu", MduEntry},         {"lsof", LsofEntry},
    {"mdf", MdfEntry},         {"pkill", PkillEntry},
    {"pgrep", PgrepEntry},     {"uptime", UptimeEntry},
};

__attribute__((format(printf, 1, 0))) void WriteMessage(const char *format, va_list arguments) {
  char message[1024];
  vsnprintf(message, sizeof(message), format, arguments);
  fputs(message, Messages());
}

// As POSIX basename, but leaves the path alone: it is printed later as typed.
std::string_view FinalComponent(const char *path) {
  std::string_view rest = path != nullptr ? path : "";
  if (rest.empty()) return ".";
  while (rest.size() > 1 && rest.ends_with('/')) rest.remove_suffix(1);
  if (rest.size() > 1) rest.remove_prefix(rest.rfind('/') + 1);
  return rest;
}

void PrintToolNames() {
  for (const Tool &tool : ToolTable) fprintf(Messages(), "   %s\n", tool.name);
}

// A descriptor that a library opens must not take the place of a closed standard stream: what is
// printed would go into a file that a tool writes.
void OccupyStandardStreams() {
  for (int stream = STDIN_FILENO; stream <= STDERR_FILENO; ++stream) {
    if (fcntl(stream, F_GETFD) == -1) (void)open("/", O_PATH | O_CLOEXEC);
  }
}

bool IsCacheOption(const char *argument) {
  const std::string_view option = argument;
  return option == "-c" || option == "--cache";
}

// Off the host only a cache run is allowed; ends the process when this is none.
void CheckHost(int argc, char **argv) {
  if (HostType_OSIsZLK() || HostType_OSIsSimulator()) return;
  if (argc < 4) {
    fputs("usage: zlkkiftools -c cache function\n  available functions:\n", Messages());
    PrintToolNames();
    exit(1);
  }
  if (!IsCacheOption(argv[1])) Panic("error: must be invoked with cache when not on Nevra\n");
}

void CheckSignature() {
  char kernelBuildDate[21] = "";
  const char *programBuildDate = "";
  if (KIF_CheckSig(kernelBuildDate, sizeof(kernelBuildDate), &programBuildDate) == 0) return;
  kernelBuildDate[sizeof(kernelBuildDate) - 1] = '\0';
  fprintf(Messages(),
          "error: md5 signature mismatch with running zelkernel built on %s (my build date: %s)\n",
          Shown(kernelBuildDate, stderr).text(), programBuildDate);
  exit(1);
}

int RunTool(int argc, char **argv) {
  const std::string_view name = FinalComponent(argv[0]);
  for (const Tool &tool : ToolTable) {
    if (name == tool.name) return tool.entry(argc, argv);
  }
  fprintf(Messages(),
          "usage: %s [options] [function] [arguments]\n       or [function] [arguments]\n\n"
          "Options:\n   --cache, -c    Perform the operation on a given KIF cache file\n\n"
          "Functions:\n",
          Printable(argv[0] != nullptr ? argv[0] : "").text());
  PrintToolNames();
  return 1;
}

}  // namespace

void Panic(const char *format, ...) {
  va_list arguments;
  va_start(arguments, format);
  WriteMessage(format, arguments);
  va_end(arguments);
  exit(1);
}

void Warning(const char *format, ...) {
  va_list arguments;
  va_start(arguments, format);
  WriteMessage(format, arguments);
  va_end(arguments);
}

void FormatSize(uint64_t bytes, char *buffer, size_t size) {
  const char unit = bytes > 0xFFFFF ? 'M' : bytes > 1023 ? 'K' : 'B';
  const int shift = unit == 'M' ? 20 : unit == 'K' ? 10 : 0;
  snprintf(buffer, size, "%" PRIu64 "%c", bytes >> shift, unit);
}

__attribute__((visibility("default"))) int main(int argc, char **argv) {
  OccupyStandardStreams();
  OpenOutput();
  const bool programForm = FinalComponent(argv[0]).starts_with(kProgramName);
  CheckHost(argc, argv);
  if (programForm && argc >= 4 && IsCacheOption(argv[1])) {
    const KIF_Status status = KIF_UseCache(argv[2], 0);
    if (status != 0) {
      fprintf(Messages(), "Couldn't use specifed cache file %s: %s\n", Printable(argv[2]).text(),
              ZLK_ReturnStatusToString(status));
      return 1;
    }
    argc -= 3;
    argv += 3;
    InvokedWithCache = 1;
  } else {
    ZlkSyscall_Init(1, 0, 0);
    if (programForm && argc >= 2) {
      --argc;
      ++argv;
    }
    InvokedWithCache = 0;
  }
  CheckSignature();
  return CloseOutput(RunTool(argc, argv));
}
