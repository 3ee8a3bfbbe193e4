// What the tools do with a cartel's command line.
#pragma once

#include <string.h>

// Cuts `text` at its first blank, a space. Gives the text after that blank, or null where there is
// none.
inline char *CutAtBlank(char *text) {
  char *blank = strchr(text, ' ');
  if (blank == nullptr) return nullptr;
  *blank = '\0';
  return blank + 1;
}
