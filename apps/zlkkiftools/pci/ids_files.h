// The PCI ID files, read as one stream of lines.
#pragma once

#include <cstddef>
#include <string_view>

#include "base/array.h"

// An ordered list of files and a cursor over their lines. A file is read once, when the cursor
// first comes to it; one that cannot be opened or is no regular file has no lines, nor has one that
// does not fit into memory, which a message tells. Lines, paths and the bytes behind
// them live as long as the list. Being out of memory, and a path that is too long, end the process
// with a message and status 1.
class PciIdsFileList {
 public:
  PciIdsFileList() = default;
  ~PciIdsFileList();
  PciIdsFileList(PciIdsFileList &&other) = default;
  PciIdsFileList &operator=(PciIdsFileList &&other) = default;

  // Appends a file by its path, of at most 255 characters.
  void AddPath(const char *path);

  // Appends a file whose `size` bytes are given; both texts are copied.
  void AddBytes(const char *path, const char *bytes, size_t size);

  // Appends every file of a directory whose name ends in ".ids" after one character or more, in
  // the order of the directory listing. Nothing when the directory cannot be opened.
  void AddDirectory(const char *directory);

  // The next line, at most 255 bytes with its newline; a longer one comes in pieces. The text ends
  // at the first NUL. False after the last line of the last file.
  bool NextLine(std::string_view *line);

  // Of the line that NextLine gave last: the path of its file, its number in that file from 1, and
  // whether the file is another than the last of the list.
  const char *CurrentPath() const { return current_ < files_.size() ? files_[current_].path : ""; }
  int LineNumber() const { return lineNumber_; }
  bool InOverrideFile() const { return current_ + 1 < files_.size(); }

  // Goes back to the first line of the first file.
  void Rewind();

 private:
  struct File {
    char *path = nullptr;
    char *bytes = nullptr;  // null: not read yet, or nothing in it
    size_t size = 0;
    bool read = false;
    bool hasNul = false;
  };

  File *Append(const char *path);
  static void Load(File *file);
  static void Read(int descriptor, File *file);

  Array<File> files_;
  size_t current_ = 0;
  size_t position_ = 0;  // in the bytes of the current file
  int lineNumber_ = 0;
};
