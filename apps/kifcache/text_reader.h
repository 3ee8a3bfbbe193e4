// Reading the text form of a host: see docs/text-form.md.
#pragma once

#include <string_view>

#include "host_model.h"

// Reads `text` into `model`, which is empty before and sorted after. On an error says on standard
// error what is wrong in which line of `name` and gives false.
bool ReadText(std::string_view text, const char *name, HostModel *model);
