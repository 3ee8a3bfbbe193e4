// What kifcache says on standard error.
#pragma once

#include <string>
#include <string_view>

// A word of somebody's input, such as a file name, as it may stand in a message: a control
// character would forge a line, or do something to a terminal.
std::string Masked(std::string_view word);

// Says "kifcache: ABOUT: MESSAGE" in a line. Both are masked. Gives false.
bool Complain(std::string_view about, std::string_view message);
