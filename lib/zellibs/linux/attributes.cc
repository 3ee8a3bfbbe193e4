#include "linux/attributes.h"

#include <limits.h>
#include <stdio.h>

#include <cstring>

#include "linux/files.h"
#include "linux/pci_bus.h"
#include "status.h"

bool ReadNumber(int directory, const char *path, uint64_t *number) {
  char text[64];
  const char *place = text;
  return ReadBelow(directory, path, text, sizeof(text)) == KIF_STATUS_OK &&
         TakeNumber(&place, number);
}

bool ReadLine(int directory, const char *path, char *field, size_t size) {
  char text[512];
  if (ReadBelow(directory, path, text, sizeof(text)) != KIF_STATUS_OK) return false;
  const char *line = text + strspn(text, " \t");
  size_t length = strcspn(line, "\n");
  while (length > 0 && (line[length - 1] == ' ' || line[length - 1] == '\t')) --length;
  CopyText(field, size, line, length);
  return length > 0;
}

bool ReadLastName(int directory, const char *path, char *field, size_t size) {
  char target[PATH_MAX];
  if (ReadLinkBelow(directory, path, target, sizeof(target)) != KIF_STATUS_OK) return false;
  const char *slash = strrchr(target, '/');
  const char *name = slash != nullptr ? slash + 1 : target;
  CopyText(field, size, name, strlen(name));
  return *name != '\0';
}

bool FindPciFunction(const char *path, char *field, size_t size) {
  bool found = false;
  for (const char *name = path; name != nullptr; name = strchr(name, '/')) {
    if (*name == '/') ++name;
    const char *place = name;
    uint32_t part[4];
    const bool isFunction = TakeHex(&place, ':', &part[0]) && TakeHex(&place, ':', &part[1]) &&
                            TakeHex(&place, '.', &part[2]) && TakeHex(&place, '/', &part[3]);
    if (!isFunction) continue;
    snprintf(field, size, "%04x:%02x:%02x.%x", part[0], part[1], part[2], part[3]);
    found = true;
  }
  return found;
}
