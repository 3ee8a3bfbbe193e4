// What several targets work with: a folder in memory, no messages, and no host but one that the
// target chooses.
#pragma once

#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <unistd.h>

#include <filesystem>
#include <string>

namespace {

std::string folder = "/dev/shm/zlkkiftools-fuzz.XXXXXX";

[[maybe_unused]] FILE *const nowhere = fopen("/dev/null", "w");

// Makes the folder, which is removed at the end; without it there is nothing to be done.
[[maybe_unused]] const bool isPrepared = [] {
  if (nowhere == nullptr || mkdtemp(folder.data()) == nullptr) abort();
  static const pid_t owner = getpid();
  atexit([] {
    if (getpid() != owner) return;
    std::error_code ignored;
    std::filesystem::remove_all(folder, ignored);
  });
  return setenv("ZELLIBS_HOST", "none", 1) == 0;
}();

// Writes a file of the folder, with the folders it needs.
[[maybe_unused]] void Write(const std::string &path, const void *bytes, size_t size) {
  constexpr int kHow = O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC;
  int file = open((folder + path).c_str(), kHow, 0600);
  if (file == -1) {
    std::filesystem::create_directories(std::filesystem::path(folder + path).parent_path());
    file = open((folder + path).c_str(), kHow, 0600);
  }
  if (file == -1 || write(file, bytes, size) != static_cast<ssize_t>(size)) abort();
  close(file);
}

}  // namespace

// The tools' messages go nowhere; what the fuzzer says goes to descriptor 2.
extern "C" int LLVMFuzzerInitialize(int *, char ***) {
  stderr = nowhere;
  return 0;
}
