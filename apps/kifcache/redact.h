// Taking out of a recording what may be private.
#pragma once

#include <string>
#include <string_view>

// The first word of a text, and "…" in the place of the others: of a command line the program, of a
// socket its protocol.
std::string RedactBehindFirstWord(std::string_view text);

// A boot command line in which every option's value, and every word after a lone "--", is "…".
std::string RedactBootCommandLine(std::string_view commandLine);

// What stands in the place of a file of boot options and of a hardware address.
std::string Redacted();
