// Taking out of a finished model what may be private, as the marks of the catalogue say. What stays
// is listed in kifcache(1).
#pragma once

#include <string>

#include "host_model.h"

// The rules that are followed here, as they stand in the facts of a recording.
constexpr char kRedactionRules[] = "rules 2";

// Redacts a model, and sorts it anew; nodes that the catalogue does not have go. The host gets
// `name`; where that is empty it is "redacted", or keeps the name that an earlier redaction by the
// same rules gave it. Such a model is as it was.
void RedactModel(const std::string &name, HostModel *model);
