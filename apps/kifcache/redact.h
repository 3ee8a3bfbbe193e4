// Taking out of a finished model what may be private, as the marks of the catalogue say. Texts that
// name a thing stay, but for addresses, and so do bytes that no field names.
#pragma once

#include "host_model.h"

// The rules that are followed here, as they stand in the facts of a recording.
constexpr char kRedactionRules[] = "rules 1";

void RedactModel(HostModel *model);
