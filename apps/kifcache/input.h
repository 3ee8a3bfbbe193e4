// What a command reads: recordings and texts in files, or standard input for "-".
#pragma once

#include <string_view>

#include "base/bytes.h"
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

// A text that somebody wrote, or standard input for "-", expanded where it is compressed.
class InputText {
 public:
  InputText() = default;
  ~InputText() { ReleaseFileBytes(&expanded_); }
  InputText(const InputText &) = delete;
  InputText &operator=(const InputText &) = delete;

  // False after a message.
  bool Read(const char *path);

  std::string_view text() const {
    if (expanded_.map == nullptr) return {read_.text(), read_.size()};
    return {reinterpret_cast<const char *>(expanded_.map), expanded_.size};
  }

 private:
  Bytes read_;
  FileBytes expanded_ = {};
};

// Whether a path is the one for standard input and output.
bool IsStandardStream(const char *path);

// The path as messages name it.
const char *InputName(const char *path);
