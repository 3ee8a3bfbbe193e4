#include "pci/ids_line.h"

#include "base/hex.h"

namespace {

// A text is read as if a NUL followed it.
char At(std::string_view text, size_t index) {
  return index < text.size() ? text[index] : '\0';
}

bool IsBlank(char c) {
  return c == ' ' || c == '\t';
}

size_t SkipBlanks(std::string_view text, size_t at) {
  while (IsBlank(At(text, at))) ++at;
  return at;
}

}  // namespace

DeviceLine DeviceLineKind(std::string_view line) {
  switch (At(line, 0)) {
    case '#':
    case ' ':
    case '\n':
      return DeviceLine::kIgnored;
    case '\t':
      if (At(line, 1) != '\t') return DeviceLine::kDevice;
      return At(line, 2) != '\t' ? DeviceLine::kSubsystem : DeviceLine::kIgnored;
    case 'f':
      return line.starts_with("ffff") ? DeviceLine::kEnd : DeviceLine::kVendor;
    default:
      return DeviceLine::kVendor;
  }
}

ClassLine ClassLineKind(std::string_view line) {
  switch (At(line, 0)) {
    case 'C':
      return ClassLine::kClass;
    case '\t':
      return At(line, 1) != '\t' ? ClassLine::kSubclass : ClassLine::kProgIf;
    default:
      return ClassLine::kIgnored;
  }
}

bool ParseIdAndName(std::string_view text, size_t nameRoom, uint32_t *number,
                    std::string_view *name) {
  const size_t start = SkipBlanks(text, 0);
  size_t at = start;
  uint32_t value = 0;
  for (int digit; (digit = HexDigit(At(text, at))) >= 0; ++at) {
    value = value << 4 | static_cast<uint32_t>(digit);
  }
  if (at == start || !IsBlank(At(text, at))) return false;
  *number = value;
  if (nameRoom == 0) return true;

  text.remove_prefix(SkipBlanks(text, at));
  if (text.ends_with('\n')) text.remove_suffix(1);
  if (text.empty()) return false;
  if (text.size() > nameRoom - 1) text.remove_suffix(text.size() - (nameRoom - 1));
  *name = text;
  return true;
}
