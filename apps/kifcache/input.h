// The recordings that a command reads: files, or standard input for "-".
#pragma once

#include "cache_file.h"

// An open recording, expanded where it is compressed.
class InputRecording {
 public:
  // Says on standard error what is wrong with a recording that cannot be read, and what to do.
  explicit InputRecording(const char *path);
  ~InputRecording() { CloseCacheFile(&file_); }
  InputRecording(const InputRecording &) = delete;
  InputRecording &operator=(const InputRecording &) = delete;

  bool isOpen() const { return isOpen_; }
  const CacheFile &file() const { return file_; }

 private:
  CacheFile file_ = {};
  bool isOpen_;
};

// Whether a path is the one for standard input and output.
bool IsStandardStream(const char *path);

// The path as messages name it.
const char *InputName(const char *path);
