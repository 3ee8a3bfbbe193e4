// Taking out of a recording what may be private.
#pragma once

#include <string>
#include <string_view>

// A command line without its arguments: the program, and "…" in their place.
std::string RedactCommandLine(std::string_view commandLine);

// A boot command line in which every option's value, and every word after a lone "--", is "…".
std::string RedactBootCommandLine(std::string_view commandLine);

// What stands in the place of a file of boot options.
std::string RedactedContent();
