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

// A text that somebody chose freely, a file's name or a word of a command line, as it may stand in
// a message anywhere: its control characters are '?', lest it forge a line of a log. Lives as long
// as the call it is passed to.
class Printable {
 public:
  explicit Printable(const char *text) : text_(text != nullptr ? strdup(text) : nullptr) {
    if (text_ != nullptr) MaskControls(text_, strlen(text_));
  }
  ~Printable() { free(text_); }
  Printable(const Printable &) = delete;
  Printable &operator=(const Printable &) = delete;

  const char *text() const { return text_ != nullptr ? text_ : "?"; }

 private:
  char *text_;
};

// A text as it may be shown on `stream`: on a terminal its control characters but tabs are
// '?', elsewhere it is the text itself. Lives as long as the call it is passed to:
//   printf("%-20s\n", Shown(name).text());
class Shown {
 public:
  explicit Shown(const char *text, FILE *stream = stdout) : Shown(text, IsTerminal(stream)) {}
  ~Shown() { free(masked_); }
  Shown(const Shown &) = delete;
  Shown &operator=(const Shown &) = delete;

  const char *text() const { return text_; }

 protected:
  Shown(const char *text, bool masked) : text_(text) {
    if (masked) Mask();
  }

 private:
  void Mask() {
    masked_ = strdup(text_);
    const size_t length = strlen(text_);
    if (masked_ != nullptr) MaskControls(masked_, length);
    for (size_t i = 0; masked_ != nullptr && i < length; ++i) {
      if (text_[i] == '\t') masked_[i] = '\t';  // moves the cursor, and no more
    }
    text_ = masked_ != nullptr ? masked_ : "?";
  }

  char *masked_ = nullptr;
  const char *text_;
};

// The same for the name of a file or folder, which a host hands out as it is, for it selects: where
// it has a line end it is masked everywhere, lest it forge a row.
class ShownName : public Shown {
 public:
  explicit ShownName(const char *name, FILE *stream = stdout)
      : Shown(name, IsTerminal(stream) || strchr(name, '\n') != nullptr) {}
};
