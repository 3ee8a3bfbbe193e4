// Recording the present host through the platform library's own operations, so that any library
// with this face can be recorded.
#pragma once

#include "host_model.h"

// Walks every node of the host into `model`, which is empty before and sorted after. Answers are
// recorded as they are, failing ones with their status; "not found" is what a file answers anyway.
// What is too large to keep is left out and counted in the facts. Where there is no host to record
// says so on standard error and gives false.
bool RecordHost(HostModel *model);
