// Hexadecimal digits.
#pragma once

#include <cstdint>

struct HexDigitWorths {
  int8_t of[256];

  constexpr HexDigitWorths() : of() {
    for (int8_t &worth : of) worth = -1;
    for (int8_t i = 0; i < 16; ++i) {
      of[static_cast<unsigned char>("0123456789abcdef"[i])] = i;
      of[static_cast<unsigned char>("0123456789ABCDEF"[i])] = i;
    }
  }
};
inline constexpr HexDigitWorths kHexDigitWorths;

// What a character is worth as a hexadecimal digit; -1 when it is none.
inline int HexDigit(char c) {
  return kHexDigitWorths.of[static_cast<unsigned char>(c)];
}

// Writes the two digits of `byte`, in lower case, to `digits`.
inline void PutHex(unsigned char byte, char *digits) {
  constexpr char kDigits[] = "0123456789abcdef";
  digits[0] = kDigits[byte >> 4];
  digits[1] = kDigits[byte & 15];
}
