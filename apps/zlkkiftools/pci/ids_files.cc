#include "pci/ids_files.h"

#include <dirent.h>
#include <errno.h>
#include <fcntl.h>
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include "base/io.h"
#include "base/shown.h"
#include "output.h"

namespace {

constexpr size_t kLongestPath = 255;
constexpr size_t kLongestLine = 255;

[[noreturn]] void EndWith(const char *message) {
  fputs(message, Messages());
  exit(1);
}

[[noreturn]] void OutOfMemory() {
  EndWith("Not enough memory for file list\n");
}

bool IsIdsFileName(std::string_view name) {
  return name.size() >= 5 && name.ends_with(".ids");
}

}  // namespace

PciIdsFileList::File *PciIdsFileList::Append(const char *path) {
  if (strlen(path) > kLongestPath) EndWith("Found corrupted file name\n");
  File file = {.path = strdup(path)};
  if (file.path == nullptr || !files_.Append(file)) OutOfMemory();
  return files_.end() - 1;
}

void PciIdsFileList::AddPath(const char *path) {
  Append(path);
}

void PciIdsFileList::AddBytes(const char *path, const char *bytes, size_t size) {
  File *file = Append(path);
  file->read = true;
  if (size == 0) return;
  file->bytes = static_cast<char *>(malloc(size));
  if (file->bytes == nullptr) OutOfMemory();
  memcpy(file->bytes, bytes, size);
  file->size = size;
  file->hasNul = memchr(bytes, '\0', size) != nullptr;
}

void PciIdsFileList::AddDirectory(const char *directory) {
  DIR *listing = opendir(directory);
  if (listing == nullptr) return;
  while (const dirent *entry = readdir(listing)) {
    if (strlen(entry->d_name) > kLongestPath) EndWith("Found corrupted file name\n");
    if (!IsIdsFileName(entry->d_name)) continue;
    char path[kLongestPath + 2];  // one more than allowed, so that Append notices
    snprintf(path, sizeof(path), "%s/%s", directory, entry->d_name);
    Append(path);
  }
  closedir(listing);
}

// A mapping would cost less, but the names and lengths taken from it would not survive a package
// manager or an editor that writes the file. A failed read ends the file.
void PciIdsFileList::Read(int descriptor, File *file) {
  struct stat status;
  if (fstat(descriptor, &status) != 0 || !S_ISREG(status.st_mode) || status.st_size <= 0) return;
  const auto size = static_cast<uint64_t>(status.st_size);
  if (size < SIZE_MAX) file->bytes = static_cast<char *>(malloc(static_cast<size_t>(size)));
  if (file->bytes == nullptr) {
    fprintf(Messages(), "Not enough memory for file %s\n", Printable(file->path).text());
    return;
  }
  ReadAt(descriptor, file->bytes, static_cast<size_t>(size), 0, &file->size);
  file->hasNul = memchr(file->bytes, '\0', file->size) != nullptr;
}

// Whoever may write into the folder could have a pipe there.
void PciIdsFileList::Load(File *file) {
  file->read = true;
  const int descriptor = open(file->path, O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY);
  if (descriptor < 0) return;
  Read(descriptor, file);
  close(descriptor);
}

bool PciIdsFileList::NextLine(std::string_view *line) {
  for (; current_ < files_.size(); ++current_) {
    File *file = &files_[current_];
    if (!file->read) Load(file);
    const size_t left = file->size - position_;
    if (left > 0) {
      const char *start = file->bytes + position_;
      const size_t limit = left < kLongestLine ? left : kLongestLine;
      const void *newline = memchr(start, '\n', limit);
      size_t length = limit;
      if (newline != nullptr) length = static_cast<const char *>(newline) + 1 - start;
      position_ += length;
      ++lineNumber_;
      *line = {start, file->hasNul ? strnlen(start, length) : length};
      return true;
    }
    position_ = 0;
    lineNumber_ = 0;
  }
  return false;
}

void PciIdsFileList::Rewind() {
  current_ = 0;
  position_ = 0;
  lineNumber_ = 0;
}

PciIdsFileList::~PciIdsFileList() {
  for (const File &file : files_) {
    free(file.path);
    free(file.bytes);
  }
}
