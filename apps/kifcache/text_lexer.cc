#include "text_lexer.h"

#include <stdarg.h>
#include <stdio.h>

#include <charconv>
#include <cstring>

#include "base/hex.h"
#include "messages.h"
#include "progress.h"

bool ParseNumber(std::string_view word, Number *number) {
  number->negative = word.starts_with('-');
  if (number->negative) word.remove_prefix(1);
  int base = 10;
  if (word.starts_with("0x") || word.starts_with("0X")) {
    word.remove_prefix(2);
    base = 16;
  }
  const auto [end, error] =
      std::from_chars(word.data(), word.data() + word.size(), number->bits, base);
  if (word.empty() || error != std::errc() || end != word.data() + word.size()) return false;
  if (!number->negative) return true;
  if (number->bits > uint64_t{1} << 63) return false;
  number->bits = 0 - number->bits;
  return true;
}

bool Fits(const Number &number, uint32_t size) {
  const auto value = static_cast<int64_t>(number.bits);
  if (number.negative) return size == 8 || value >= -(int64_t{1} << (size * 8 - 1));
  return size == 8 || number.bits >> (size * 8) == 0;
}

bool ParseHex(std::string_view digits, std::string *bytes) {
  if (digits.size() % 2 != 0) return false;
  bytes->clear();
  for (size_t i = 0; i < digits.size(); i += 2) {
    const int high = HexDigit(digits[i]);
    const int low = HexDigit(digits[i + 1]);
    if (high < 0 || low < 0) return false;
    bytes->push_back(static_cast<char>(high * 16 + low));
  }
  return true;
}

bool TextLexer::Fail(const char *format, ...) {
  ClearProgress();
  char message[1024];
  va_list arguments;
  va_start(arguments, format);
  vsnprintf(message, sizeof(message), format, arguments);
  va_end(arguments);
  fprintf(stderr, "%s:%u: %s\n", Masked(name_).c_str(), lineNumber_, Masked(message).c_str());
  return false;
}

bool TextLexer::NextLine() {
  while (!rest_.empty()) {
    const size_t end = rest_.find('\n');
    line_ = rest_.substr(0, end);
    rest_.remove_prefix(end == rest_.npos ? rest_.size() : end + 1);
    ++lineNumber_;
    if (line_.ends_with('\r')) line_.remove_suffix(1);
    if (!AtEnd() && !line_.starts_with('#')) return true;
  }
  return false;
}

void TextLexer::SkipBlanks() {
  const size_t start = line_.find_first_not_of(" \t");
  line_.remove_prefix(start == line_.npos ? line_.size() : start);
}

std::string_view TextLexer::NextWord(bool stopAtEquals) {
  SkipBlanks();
  size_t end = line_.find_first_of(" \t");
  if (end == line_.npos) end = line_.size();
  if (stopAtEquals) {
    const size_t equals = line_.find('=');
    if (equals < end) end = equals + 1;
  }
  const std::string_view word = line_.substr(0, end);
  line_.remove_prefix(end);
  return word;
}

bool TextLexer::TakeWord(std::string_view word) {
  const std::string_view before = line_;
  if (NextWord(false) == word) return true;
  line_ = before;
  return false;
}

bool TextLexer::ReadNumber(const char *what, Number *number) {
  const std::string_view word = NextWord(false);
  return ParseNumber(word, number) || Fail("%s \"%.*s\" is no number", what, PRINTED(word));
}

bool TextLexer::ReadUnsigned32(const char *what, uint32_t *number) {
  Number parsed;
  if (!ReadNumber(what, &parsed)) return false;
  if (parsed.negative || !Fits(parsed, 4)) return Fail("%s is out of range", what);
  *number = static_cast<uint32_t>(parsed.bits);
  return true;
}

// Reads a text in quotes.
bool TextLexer::ReadText(std::string *text) {
  text->clear();
  if (!AtText()) return Fail("a text in double quotes is missing");
  for (size_t i = 1; i < line_.size(); ++i) {
    if (line_[i] == '"') {
      line_.remove_prefix(i + 1);
      if (!line_.empty() && line_[0] != ' ' && line_[0] != '\t') {
        return Fail("a text ends before \"%.*s\"", PRINTED(line_));
      }
      return true;
    }
    if (line_[i] != '\\') {
      text->push_back(line_[i]);
      continue;
    }
    constexpr char kLetters[] = "\"\\ntr";
    constexpr char kMeant[] = "\"\\\n\t\r";
    const char letter = ++i < line_.size() ? line_[i] : '\0';
    const char *found = letter != '\0' ? strchr(kLetters, letter) : nullptr;
    std::string byte;
    if (found != nullptr) {
      text->push_back(kMeant[found - kLetters]);
    } else if (letter == 'x' && i + 2 < line_.size() && ParseHex(line_.substr(i + 1, 2), &byte)) {
      text->append(byte);
      i += 2;
    } else {
      return Fail("a backslash stands before \", \\, n, t, r or xHH only");
    }
  }
  return Fail("a text has no closing quote");
}

// Reads a text that cannot hold a NUL.
bool TextLexer::ReadPlainText(std::string *text, const char *what) {
  if (!ReadText(text)) return false;
  return text->find('\0') == text->npos || Fail("a %s cannot hold a NUL", what);
}
