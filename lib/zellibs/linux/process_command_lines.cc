#include "linux/process_command_lines.h"

#include <stdio.h>

#include <cstring>

#include "base/everlasting.h"
#include "linux/files.h"
#include "status.h"

namespace {

// One more byte than is kept tells a command line that was cut from one that just fits.
constexpr size_t kCommandLineRead = kCommandLineSize + 4;

struct CommandLines {
  Bytes kept;  // each terminated

  // The one read last.
  int64_t process = 0;
  bool current = false;
  KIF_Status status = KIF_STATUS_OK;
  char text[kCommandLineSize] = "";
};

Everlasting<CommandLines> snapshot;

}  // namespace

KIF_Status ReadCommandLineFile(int proc, int32_t id, int32_t thread, char *text) {
  char path[48];
  char raw[kCommandLineRead];
  size_t length;
  if (thread == id) {
    snprintf(path, sizeof(path), "%d/cmdline", id);
  } else {
    snprintf(path, sizeof(path), "%d/task/%d/cmdline", id, thread);
  }
  const KIF_Status status = ReadPieceBelow(proc, path, raw, sizeof(raw), &length);
  text[0] = '\0';
  if (status != KIF_STATUS_OK) return status;
  for (size_t i = 0; i < length; ++i) {
    if (raw[i] == '\0') raw[i] = ' ';
  }
  CopyText(text, kCommandLineSize, raw, length);
  length = strlen(text);
  while (length > 0 && text[length - 1] == ' ') text[--length] = '\0';
  return length > 0 ? KIF_STATUS_OK : KIF_STATUS_NO_COMMAND_LINE;
}

bool KeepCommandLine(const char *text, Process *process) {
  process->commandLine = static_cast<uint32_t>(snapshot->kept.size());
  return snapshot->kept.Append(text, strlen(text) + 1);
}

void ClearCommandLines() {
  snapshot->kept.Clear();
}

void AllowLastCommandLine(int32_t process) {
  if (snapshot->process == process) snapshot->current = true;
}

void ForgetCommandLine() {
  snapshot->current = false;
}

KIF_Status TakeCommandLine(int proc, int32_t id, Process *process, char *text) {
  if (process != nullptr && process->commandLine != kNoCommandLine) {
    strcpy(text, snapshot->kept.text() + process->commandLine);
    process->commandLine = kNoCommandLine;
    return KIF_STATUS_OK;
  }
  CommandLines &last = *snapshot;
  if (last.process != id || !last.current) {
    const int32_t living = process != nullptr && process->living != 0 ? process->living : id;
    last.status = ReadCommandLineFile(proc, id, living, last.text);
    last.process = id;
    // One that was listed has ended since, which is no failure to whoever walks the list.
    if (last.status == KIF_STATUS_NOT_FOUND && process != nullptr) {
      last.status = KIF_STATUS_NO_COMMAND_LINE;
    }
  }
  last.current = false;
  strcpy(text, last.text);
  return last.status;
}
