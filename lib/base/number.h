// Numbers in text.
#pragma once

#include <cstdint>

// Converts the decimal number that `text` begins with and moves `*text` behind it; false where
// there is none. Numbers beyond 64 bits become the largest one.
inline bool TakeNumber(const char **text, uint64_t *number) {
  const char *digit = *text;
  uint64_t value = 0;
  for (; *digit >= '0' && *digit <= '9'; ++digit) {
    const auto next = static_cast<uint64_t>(*digit - '0');
    value = value > (UINT64_MAX - next) / 10 ? UINT64_MAX : value * 10 + next;
  }
  if (digit == *text) return false;
  *text = digit;
  *number = value;
  return true;
}
