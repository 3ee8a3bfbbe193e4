#include "linux/driver_product.h"

#include <cstdio>
#include <cstring>

#include "linux/files.h"
#include "status.h"

// The folders in which a driver's products stand, the most telling first. In a folder only names
// with the prefix count: "card0", but not the card's connectors.
struct ProductKind {
  const char *folder;  // null: the products stand beside the attributes
  const char *prefix;
};

namespace {

constexpr ProductKind kProductKinds[] = {
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

template <size_t Size>
void KeepFirst(const char *name, char (&first)[Size]) {
  if (first[0] == '\0' || ComesBefore(name, first)) snprintf(first, Size, "%s", name);
}

// Finds the product in the folder of its kind below the open folder `device`.
void FindProduct(int device, ProductFolders *folders) {
  const ProductKind *kind = folders->best;
  if (kind == nullptr || kind->folder == nullptr) return;
  folders->product[0] = '\0';
  DirectoryReader reader;
  if (reader.OpenBelow(device, kind->folder) != KIF_STATUS_OK) return;
  while (const char *name = reader.Next()) {
    const bool fits = kind->prefix[0] == '\0' || IsNumbered(name, kind->prefix);
    if (fits) KeepFirst(name, folders->product);
  }
}

}  // namespace

void NoteProductFolder(const char *name, ProductFolders *folders) {
  if (IsNumbered(name, "virtio") || IsNumbered(name, "ata")) KeepFirst(name, folders->carried);
  for (const ProductKind &kind : kProductKinds) {
    if (folders->best != nullptr && &kind > folders->best) return;
    const bool fits =
        kind.folder != nullptr ? strcmp(name, kind.folder) == 0 : IsNumbered(name, kind.prefix);
    if (!fits) continue;
    if (kind.folder == nullptr) KeepFirst(name, folders->product);
    folders->best = &kind;
    return;
  }
}

// What the device carries is looked at where it has made nothing of its own.
void CopyDriverProduct(int device, const ProductFolders &folders, char *field, size_t size) {
  ProductFolders own = folders;
  ProductFolders below;
  FindProduct(device, &own);
  DirectoryReader carried;
  if (own.product[0] == '\0' && own.carried[0] != '\0' &&
      carried.OpenBelow(device, own.carried) == KIF_STATUS_OK) {
    while (const char *name = carried.Next()) NoteProductFolder(name, &below);
    FindProduct(carried.fd(), &below);
  }
  const char *product = own.product[0] != '\0' ? own.product : below.product;
  CopyText(field, size, product, strlen(product));
}
