// A process to be found on this machine.
#pragma once

#include <signal.h>
#include <spawn.h>
#include <stdlib.h>
#include <sys/types.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <string>

// Runs a sleep program of its own name, in `directory`, for as long as it lives.
class Sleeper {
 public:
  explicit Sleeper(const std::string &directory)
      : name_("sleeper" + std::to_string(getpid())), program_(directory + "/" + name_) {
    std::filesystem::copy_file("/bin/sleep", program_);
    char seconds[] = "86399";
    char *arguments[] = {program_.data(), seconds, nullptr};
    if (posix_spawn(&id_, program_.c_str(), nullptr, nullptr, arguments, nullptr) != 0) abort();
  }
  ~Sleeper() {
    kill(id_, SIGKILL);
    waitpid(id_, nullptr, 0);
  }
  Sleeper(const Sleeper &) = delete;
  Sleeper &operator=(const Sleeper &) = delete;

  const std::string &name() const { return name_; }
  const std::string &program() const { return program_; }
  std::string id() const { return std::to_string(id_); }

 private:
  std::string name_;
  std::string program_;
  pid_t id_;
};
