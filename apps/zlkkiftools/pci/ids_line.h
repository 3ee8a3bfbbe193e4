// The grammar of one line of a PCI ID file.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

// The text from `place` on, which it reaches. Unlike substr it does not bring in the C++ library's
// exceptions, whose start-up every tool would pay for.
inline std::string_view TextFrom(std::string_view text, size_t place) {
  text.remove_prefix(place);
  return text;
}

// What a line is in the device section, which comes first.
enum class DeviceLine { kIgnored, kEnd, kVendor, kDevice, kSubsystem };
DeviceLine DeviceLineKind(std::string_view line);

// What a line is in the class section, which follows the line that ends the device section.
enum class ClassLine { kIgnored, kClass, kSubclass, kProgIf };
ClassLine ClassLineKind(std::string_view line);

// Reads a hexadecimal number, blanks and a name that ends with the line. `*name` is at most
// `nameRoom` - 1 bytes of `text`; with a `nameRoom` of 0 no name is read. On failure `*name` stays
// as it was; `*number` is stored as soon as it has been read, so also when only the name fails.
bool ParseIdAndName(std::string_view text, size_t nameRoom, uint32_t *number,
                    std::string_view *name);
