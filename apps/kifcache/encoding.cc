#include "encoding.h"

#include <cstdint>
#include <cstdio>

size_t LongCharacterAt(std::string_view text) {
  const auto byte = [text](size_t i) -> uint32_t {
    return i < text.size() ? static_cast<unsigned char>(text[i]) : 0;
  };
  const size_t length = byte(0) >= 0xf0 && byte(0) <= 0xf4   ? 4
                        : byte(0) >= 0xe0 && byte(0) <= 0xef ? 3
                        : byte(0) >= 0xc2 && byte(0) <= 0xdf ? 2
                                                             : 0;
  for (size_t i = 1; i < length; ++i) {
    if ((byte(i) & 0xc0) != 0x80) return 0;
  }
  // Overlong forms, surrogates, and what lies above the last character.
  if (byte(0) == 0xe0 && byte(1) < 0xa0) return 0;
  if (byte(0) == 0xed && byte(1) >= 0xa0) return 0;
  if (byte(0) == 0xf0 && byte(1) < 0x90) return 0;
  if (byte(0) == 0xf4 && byte(1) >= 0x90) return 0;
  return length;
}

bool IsUtf8(std::string_view text) {
  while (!text.empty()) {
    const size_t length = LongCharacterAt(text);
    if (length == 0 && static_cast<unsigned char>(text[0]) >= 0x80) return false;
    text.remove_prefix(length > 0 ? length : 1);
  }
  return true;
}

std::string Quoted(std::string_view text) {
  std::string quoted = "\"";
  while (!text.empty()) {
    const auto byte = static_cast<unsigned char>(text[0]);
    size_t length = LongCharacterAt(text);
    // Terminals obey the characters U+0080 to U+009F.
    if (byte == 0xc2 && length == 2 && static_cast<unsigned char>(text[1]) < 0xa0) length = 0;
    if (length > 0) {
      quoted += text.substr(0, length);
    } else if (byte == '"' || byte == '\\') {
      quoted += '\\';
      quoted += text[0];
    } else if (byte == '\n' || byte == '\t' || byte == '\r') {
      quoted += byte == '\n' ? "\\n" : byte == '\t' ? "\\t" : "\\r";
    } else if (byte < 0x20 || byte >= 0x7f) {
      quoted += "\\x" + HexDigits(text.substr(0, 1));
    } else {
      quoted += text[0];
    }
    text.remove_prefix(length > 0 ? length : 1);
  }
  return quoted + '"';
}

std::string JsonString(std::string_view text) {
  std::string quoted = "\"";
  for (const char c : text) {
    if (c == '"' || c == '\\') {
      quoted += '\\';
      quoted += c;
    } else if (static_cast<unsigned char>(c) < 0x20 || c == 0x7f) {
      quoted += "\\u00" + HexDigits({&c, 1});
    } else {
      quoted += c;
    }
  }
  return quoted + '"';
}

std::string HexDigits(std::string_view bytes) {
  constexpr char kDigits[] = "0123456789abcdef";
  std::string digits;
  digits.reserve(bytes.size() * 2);
  for (const char c : bytes) {
    digits += kDigits[static_cast<unsigned char>(c) >> 4];
    digits += kDigits[static_cast<unsigned char>(c) & 15];
  }
  return digits;
}
