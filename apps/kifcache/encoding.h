// Bytes as text: what dump, check and error messages print of a host.
#pragma once

#include <string>
#include <string_view>

// `text` in double quotes as the text form has it: control characters and bytes that are no UTF-8
// are written out, so that it can be shown on a terminal.
std::string Quoted(std::string_view text);

// `text`, which is valid UTF-8, as a JSON string.
std::string JsonString(std::string_view text);

std::string HexDigits(std::string_view bytes);
