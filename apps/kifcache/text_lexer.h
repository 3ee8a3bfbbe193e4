// The words, numbers and texts on the lines of the text form: see docs/text-form.md.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

// A number as it is written: the 64 bits of it, and whether it stands below zero.
struct Number {
  uint64_t bits = 0;
  bool negative = false;
};

// Reads a number: decimal, or hexadecimal behind "0x", with or without a minus sign.
bool ParseNumber(std::string_view word, Number *number);

// Whether the number's bits stand for it in a field of `size` bytes, with or without a sign.
bool Fits(const Number &number, uint32_t size);

// Reads pairs of hexadecimal digits.
bool ParseHex(std::string_view digits, std::string *bytes);

// The two arguments of a "%.*s" that prints a text of a line, or the beginning of a long one.
#define PRINTED(view) static_cast<int>((view).size() < 80 ? (view).size() : 80), (view).data()

// The lines of a text, one after the other. What fails says on standard error what is wrong in
// which line of the file `name`, and gives false.
class TextLexer {
 public:
  TextLexer(std::string_view text, const char *name) : text_(text), rest_(text), name_(name) {}

  // Goes back to before the first line.
  void Rewind() {
    rest_ = text_;
    lineNumber_ = 0;
  }

  // Goes to the next line that has anything but a comment; false at the end.
  bool NextLine();

  // What stands next on the line. A word ends at a blank, or after a '=' inside it.
  bool AtEnd() { return SkipBlanks(), line_.empty(); }
  bool AtText() { return SkipBlanks(), line_.starts_with('"'); }
  std::string_view NextWord(bool stopAtEquals);
  bool TakeWord(std::string_view word);

  // Each reads what its name says, `what` being its name in the message; a plain text has no NUL.
  bool ReadText(std::string *text);
  bool ReadPlainText(std::string *text, const char *what);
  bool ReadNumber(const char *what, Number *number);
  bool ReadUnsigned32(const char *what, uint32_t *number);

  bool Fail(const char *format, ...) __attribute__((format(printf, 2, 3)));

 protected:
  std::string_view line_;  // what is left of it
  uint32_t lineNumber_ = 0;

 private:
  void SkipBlanks();

  std::string_view text_;
  std::string_view rest_;
  const char *name_;
};
