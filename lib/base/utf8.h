// UTF-8 in texts that come from anywhere, and what a terminal may be shown of them.
#pragma once

#include <cstddef>

// Whether a sequence may begin with these two bytes: not a longer way to write a character, no half
// of a pair of UTF-16 and nothing above U+10FFFF (RFC 3629, section 4).
inline bool MayBegin(unsigned char first, unsigned char second) {
  const unsigned char least = first == 0xe0 ? 0xa0 : first == 0xf0 ? 0x90 : 0x80;
  const unsigned char most = first == 0xed ? 0x9f : first == 0xf4 ? 0x8f : 0xbf;
  return second >= least && second <= most;
}

// Length of the valid UTF-8 sequence of two bytes or more that begins the `size` bytes at `text`;
// 0 when there is none.
inline size_t SequenceLength(const unsigned char *text, size_t size) {
  const size_t length = text[0] >= 0xf0 && text[0] <= 0xf4   ? 4
                        : text[0] >= 0xe0 && text[0] <= 0xef ? 3
                        : text[0] >= 0xc2 && text[0] <= 0xdf ? 2
                                                             : 0;
  if (length == 0 || length > size || !MayBegin(text[0], text[1])) return 0;
  for (size_t i = 2; i < length; ++i) {
    if ((text[i] & 0xc0) != 0x80) return 0;
  }
  return length;
}

inline bool IsUtf8(const char *text, size_t size) {
  const auto *bytes = reinterpret_cast<const unsigned char *>(text);
  for (size_t i = 0; i < size;) {
    const size_t length = bytes[i] < 0x80 ? 1 : SequenceLength(bytes + i, size - i);
    if (length == 0) return false;
    i += length;
  }
  return true;
}

// Turns the control characters among `size` bytes into '?'. Terminals obey the bytes 0x80 to 0x9f
// too, alone or as the characters U+0080 to U+009F.
inline void MaskControls(char *text, size_t size) {
  auto *bytes = reinterpret_cast<unsigned char *>(text);
  for (size_t i = 0; i < size;) {
    if (bytes[i] >= 0x20 && bytes[i] < 0x7f) {
      ++i;
      continue;
    }
    const size_t length = SequenceLength(bytes + i, size - i);
    if (length > 0 && !(bytes[i] == 0xc2 && bytes[i + 1] < 0xa0)) {
      i += length;
      continue;
    }
    if (length > 0 || bytes[i] < 0xa0) bytes[i] = '?';
    ++i;
  }
}

// The most bytes of `text`, up to `most`, that do not end in the middle of a character.
inline size_t CutAtCharacter(const char *text, size_t size, size_t most) {
  if (size <= most) return size;
  size_t cut = most;
  while (cut > 0 && most - cut < 3 && (static_cast<unsigned char>(text[cut]) & 0xc0) == 0x80) --cut;
  const auto *bytes = reinterpret_cast<const unsigned char *>(text);
  return SequenceLength(bytes + cut, size - cut) > most - cut ? cut : most;
}
