#include "messages.h"

#include <stdio.h>

#include "base/utf8.h"
#include "progress.h"

std::string Masked(std::string_view word) {
  std::string masked(word);
  MaskControls(masked.data(), masked.size());
  return masked;
}

bool Complain(std::string_view about, std::string_view message) {
  ClearProgress();
  const std::string line = Masked(std::string(about) + ": " + std::string(message));
  fprintf(stderr, "kifcache: %s\n", line.c_str());
  return false;
}
