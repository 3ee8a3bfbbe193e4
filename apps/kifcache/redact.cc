#include "redact.h"

namespace {

constexpr char kEllipsis[] = "…";

// The first word of `text`, which is taken off it with the blanks before it. A blank between double
// quotes does not end a word.
std::string_view TakeWord(std::string_view *text) {
  const size_t start = text->find_first_not_of(" \t\n");
  text->remove_prefix(start == text->npos ? text->size() : start);
  bool quoted = false;
  size_t end = 0;
  for (; end < text->size(); ++end) {
    const char c = (*text)[end];
    if (c == '"') quoted = !quoted;
    if (!quoted && (c == ' ' || c == '\t' || c == '\n')) break;
  }
  const std::string_view word = text->substr(0, end);
  text->remove_prefix(end);
  return word;
}

}  // namespace

std::string RedactBehindFirstWord(std::string_view text) {
  const size_t blank = text.find(' ');
  std::string redacted(text.substr(0, blank));
  if (blank != text.npos) redacted += std::string(" ") + kEllipsis;
  return redacted;
}

std::string RedactBootCommandLine(std::string_view commandLine) {
  // The kernel comes first; its name is no option.
  std::string redacted(TakeWord(&commandLine));
  while (true) {
    const std::string_view word = TakeWord(&commandLine);
    if (word.empty()) return redacted;
    const size_t equals = word.find('=');
    redacted += ' ';
    redacted += word.substr(0, equals == word.npos ? equals : equals + 1);
    if (equals != word.npos) redacted += kEllipsis;
    if (word != "--") continue;
    if (!TakeWord(&commandLine).empty()) redacted += std::string(" ") + kEllipsis;
    return redacted;
  }
}

std::string Redacted() {
  return kEllipsis;
}
