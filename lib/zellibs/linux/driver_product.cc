#include "linux/driver_product.h"

#include <cstdio>
#include <cstring>

#include "linux/files.h"

namespace {

// The folders in which a driver's products stand, the most telling first. In a folder only names
// with the prefix count: "card0", but not the card's connectors.
struct Product {
  const char *folder;  // null: the products stand beside the attributes
  const char *prefix;
};
constexpr Product kProducts[] = {
    {"net", ""},      {"nvme", ""},    {"block", ""},     {nullptr, "host"},
    {"mmc_host", ""}, {"drm", "card"}, {"sound", "card"}, {"infiniband", ""},
};

// Whether `name` is the prefix and a number: "host2".
bool IsNumbered(const char *name, const char *prefix) {
  const size_t length = strlen(prefix);
  const char *digits = name + length;
  uint64_t number;
  return strncmp(name, prefix, length) == 0 && TakeNumber(&digits, &number) && *digits == '\0';
}

// Orders eth2 before eth10.
bool ComesBefore(const char *left, const char *right) {
  const size_t leftLength = strlen(left);
  const size_t rightLength = strlen(right);
  return leftLength != rightLength ? leftLength < rightLength : strcmp(left, right) < 0;
}

using ProductName = char[256];

void KeepFirst(const char *name, ProductName &first) {
  if (first[0] == '\0' || ComesBefore(name, first)) snprintf(first, sizeof(first), "%s", name);
}

void FindInFolder(int directory, const Product &product, ProductName &found) {
  DirectoryReader reader;
  if (reader.OpenBelow(directory, product.folder) != 0) return;
  while (const char *name = reader.Next()) {
    if (product.prefix[0] == '\0' || IsNumbered(name, product.prefix)) KeepFirst(name, found);
  }
}

// Finds what stands directly below the open folder of a device. `below` is the first folder of a
// bus that the device carries itself (virtio0, ata1), whose products are those of the device.
void FindProduct(DirectoryReader *folder, ProductName &product, ProductName &below) {
  const Product *best = nullptr;
  while (const char *name = folder->Next()) {
    for (const Product &known : kProducts) {
      if (best != nullptr && &known > best) break;
      const bool fits = known.folder != nullptr ? strcmp(name, known.folder) == 0
                                                : IsNumbered(name, known.prefix);
      if (!fits) continue;
      if (known.folder == nullptr) KeepFirst(name, product);
      best = &known;
      break;
    }
    if (IsNumbered(name, "virtio") || IsNumbered(name, "ata")) KeepFirst(name, below);
  }
  if (best == nullptr || best->folder == nullptr) return;
  product[0] = '\0';
  FindInFolder(folder->fd(), *best, product);
}

}  // namespace

void CopyDriverProduct(int device, char *field, size_t size) {
  ProductName product = "";
  ProductName below = "";
  DirectoryReader folder;
  if (folder.OpenBelow(device, ".") == 0) FindProduct(&folder, product, below);
  if (product[0] == '\0' && below[0] != '\0') {
    DirectoryReader inner;
    ProductName unused = "";
    if (inner.OpenBelow(device, below) == 0) FindProduct(&inner, product, unused);
  }
  CopyText(field, size, product, strlen(product));
}
