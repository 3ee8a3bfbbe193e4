// Texts that come from a host, on their way to a stream.
#pragma once

#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include "base/utf8.h"

// Asked once for each stream: the answer does not change while a program runs.
inline bool IsTerminal(FILE *stream) {
  static signed char answers[2] = {-1, -1};
  signed char &answer = answers[stream == stderr ? 1 : 0];
  if (answer < 0) answer = isatty(fileno(stream)) ? 1 : 0;
  return answer != 0;
}

// A text as it may be shown on `stream`: on a terminal its control characters are '?', elsewhere it
// is the text itself. Lives as long as the call it is passed to:
//   printf("%-20s\n", Shown(name).text());
class Shown {
 public:
  explicit Shown(const char *text, FILE *stream = stdout) : text_(text) {
    if (IsTerminal(stream)) Mask();
  }
  ~Shown() { free(masked_); }
  Shown(const Shown &) = delete;
  Shown &operator=(const Shown &) = delete;

  const char *text() const { return text_; }

 private:
  void Mask() {
    masked_ = strdup(text_);
    if (masked_ != nullptr) MaskControls(masked_, strlen(masked_));
    text_ = masked_ != nullptr ? masked_ : "?";
  }

  char *masked_ = nullptr;
  const char *text_;
};
