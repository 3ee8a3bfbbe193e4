#include "encoding.h"

#include "base/hex.h"
#include "base/utf8.h"

std::string Quoted(std::string_view text) {
  std::string quoted = "\"";
  while (!text.empty()) {
    const auto byte = static_cast<unsigned char>(text[0]);
    size_t length =
        SequenceLength(reinterpret_cast<const unsigned char *>(text.data()), text.size());
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
  for (size_t i = 0; i < text.size(); ++i) {
    const char c = text[i];
    const auto isControl = [](char byte) { return static_cast<unsigned char>(byte) < 0xa0; };
    if (c == '"' || c == '\\') {
      quoted += '\\';
      quoted += c;
    } else if (c == '\xc2' && i + 1 < text.size() && isControl(text[i + 1])) {
      quoted += "\\u00" + HexDigits({&text[++i], 1});
    } else if (static_cast<unsigned char>(c) < 0x20 || c == 0x7f) {
      quoted += "\\u00" + HexDigits({&c, 1});
    } else {
      quoted += c;
    }
  }
  return quoted + '"';
}

std::string HexDigits(std::string_view bytes) {
  std::string digits(bytes.size() * 2, '\0');
  for (size_t i = 0; i < bytes.size(); ++i) {
    PutHex(static_cast<unsigned char>(bytes[i]), &digits[i * 2]);
  }
  return digits;
}
