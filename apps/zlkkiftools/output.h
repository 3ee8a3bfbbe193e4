// Standard output, the one place for it: large blocks into a pipe or file, lines on a terminal,
// checked when the tool is done.
#pragma once

#include <stdio.h>

// To be called once, before anything is printed.
void OpenOutput();

// Writes out what is still buffered. A failed write gives a message on standard error and 1 in the
// place of a `status` of 0; otherwise the result is `status`.
int CloseOutput(int status);

// A text that comes from the host, as it may be shown on `stream`: on a terminal its control
// characters are '?', elsewhere it is the text itself. Lives as long as the call it is passed to:
//   printf("%-20s\n", Shown(name).text());
class Shown {
 public:
  explicit Shown(const char *text, FILE *stream = stdout);
  ~Shown();
  Shown(const Shown &) = delete;
  Shown &operator=(const Shown &) = delete;

  const char *text() const { return text_; }

 private:
  char *masked_ = nullptr;
  const char *text_;
};
