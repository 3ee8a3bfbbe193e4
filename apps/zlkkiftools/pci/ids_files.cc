#include "pci/ids_files.h"

#include <dirent.h>
#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include "kiftools.h"

namespace {

constexpr size_t kInitialCapacity = 8;
constexpr size_t kLongestPath = 255;
constexpr size_t kLongestLine = 255;
constexpr size_t kInitialRead = 65536;

[[noreturn]] void OutOfMemory() {
  Panic("Not enough memory for file list\n");
}

// Maps a regular file, which costs an eighth of reading it: fresh memory is what is expensive.
// Null for every other kind of file, and where it cannot be mapped.
char *MapFile(int descriptor, size_t *size) {
  struct stat status;
  if (fstat(descriptor, &status) != 0 || !S_ISREG(status.st_mode) || status.st_size <= 0) {
    return nullptr;
  }
  *size = static_cast<size_t>(status.st_size);
  void *bytes = mmap(nullptr, *size, PROT_READ, MAP_PRIVATE, descriptor, 0);
  return bytes != MAP_FAILED ? static_cast<char *>(bytes) : nullptr;
}

// Reads the rest of `descriptor` into a new allocation at `*bytes`; a failed read ends the file.
size_t ReadAll(int descriptor, char **bytes) {
  size_t capacity = kInitialRead;
  size_t size = 0;
  char *buffer = static_cast<char *>(malloc(capacity));
  if (buffer == nullptr) OutOfMemory();
  for (;;) {
    const ssize_t got = read(descriptor, buffer + size, capacity - size);
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) break;
    size += static_cast<size_t>(got);
    if (size < capacity) continue;
    capacity *= 2;
    char *grown = static_cast<char *>(realloc(buffer, capacity));
    if (grown == nullptr) OutOfMemory();
    buffer = grown;
  }
  *bytes = buffer;
  return size;
}

bool IsIdsFileName(std::string_view name) {
  return name.size() >= 5 && name.ends_with(".ids");
}

}  // namespace

PciIdsFileList::File *PciIdsFileList::Append(const char *path) {
  if (strlen(path) > kLongestPath) Panic("Found corrupted file name\n");
  if (count_ == capacity_) {
    const size_t capacity = capacity_ == 0 ? kInitialCapacity : capacity_ * 2;
    auto *grown = static_cast<File *>(realloc(files_, capacity * sizeof(File)));
    if (grown == nullptr) OutOfMemory();
    files_ = grown;
    capacity_ = capacity;
  }
  File *file = &files_[count_];
  *file = {.path = strdup(path)};
  if (file->path == nullptr) OutOfMemory();
  ++count_;
  return file;
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
    if (strlen(entry->d_name) > kLongestPath) Panic("Found corrupted file name\n");
    if (!IsIdsFileName(entry->d_name)) continue;
    char path[kLongestPath + 2];  // one more than allowed, so that Append notices
    snprintf(path, sizeof(path), "%s/%s", directory, entry->d_name);
    Append(path);
  }
  closedir(listing);
}

// static
void PciIdsFileList::Load(File *file) {
  file->read = true;
  const int descriptor = open(file->path, O_RDONLY | O_CLOEXEC);
  if (descriptor < 0) return;
  file->bytes = MapFile(descriptor, &file->size);
  file->mapped = file->bytes != nullptr;
  if (!file->mapped) file->size = ReadAll(descriptor, &file->bytes);
  file->hasNul = memchr(file->bytes, '\0', file->size) != nullptr;
  close(descriptor);
}

bool PciIdsFileList::NextLine(std::string_view *line) {
  for (; current_ < count_; ++current_) {
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

void PciIdsFileList::Destroy() {
  for (size_t i = 0; i < count_; ++i) {
    free(files_[i].path);
    if (files_[i].mapped) {
      munmap(files_[i].bytes, files_[i].size);
    } else {
      free(files_[i].bytes);
    }
  }
  free(files_);
  *this = PciIdsFileList();
}
