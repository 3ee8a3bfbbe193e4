// How far a command is: a line on standard error, on a terminal alone and once it takes a moment.
#pragma once

#include <cstdint>

// Takes the line away, before a message.
void ClearProgress();

class Progress {
 public:
  // `unit` is what is counted, such as "answers".
  explicit Progress(const char *unit);
  ~Progress() { ClearProgress(); }
  Progress(const Progress &) = delete;
  Progress &operator=(const Progress &) = delete;

  // Counts one more, at the place that `where` names.
  void Step(const char *where) {
    ++count_;
    if (isTerminal_) ShowInTime(where);
  }

 private:
  void ShowInTime(const char *where);

  const char *unit_;
  uint64_t count_ = 0;
  int64_t next_;  // when the line is due, in milliseconds since the boot
  bool isTerminal_;
};
