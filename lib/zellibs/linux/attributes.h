// The files of /sys that hold one word, number or line each, and the fields that tell whether they
// are known.
#pragma once

#include <cstddef>
#include <cstdint>
#include <type_traits>

// Reads the number at the beginning of a file; false where there is none.
bool ReadNumber(int directory, const char *path, uint64_t *number);

// Reads the first line of a file without the blanks around it into a field of `size` bytes; false
// where there is none, or an empty one.
bool ReadLine(int directory, const char *path, char *field, size_t size);

// The last name of the target of a link: that of a driver, say.
bool ReadLastName(int directory, const char *path, char *field, size_t size);

// Writes the address of the last PCI function on a path ("../devices/pci0000:00/0000:00:03.0/net")
// to `field`; false where none is on it.
bool FindPciFunction(const char *path, char *field, size_t size);

// Notes in `known`, of a record beyond the tools, whether its field number `field`, counted from 0
// behind `known` itself, is known.
inline void Know(uint64_t *known, unsigned field, bool is) {
  if (is) *known |= uint64_t{1} << field;
}

// The same for a number: puts it into the field where it is known and fits.
template <typename Number>
void PutNumber(uint64_t *known, unsigned field, bool is, uint64_t number, Number *place) {
  static_assert(std::is_unsigned_v<Number>);
  if (!is || static_cast<Number>(number) != number) return;
  *place = static_cast<Number>(number);
  Know(known, field, true);
}

// The same for a field of a packed record, which no pointer may lead to: the number, or 0.
template <typename Number>
Number KnownNumber(uint64_t *known, unsigned field, bool is, uint64_t number) {
  Number kept = 0;
  PutNumber(known, field, is, number, &kept);
  return kept;
}
