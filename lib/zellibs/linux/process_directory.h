// The directory /proc/PID of the process whose files were asked for last, or that of a thread that
// lives where the main one has ended: what is read below it is
// of one process, even when the number goes to another one meanwhile.
#pragma once

#include <cstdint>

#include "zellibs.h"

// Gives the directory of `process`, which stays open until another process is asked for; opens it
// anew where `fresh` or not yet open. KIF_STATUS_NOT_FOUND where the process has gone.
KIF_Status OpenProcessDirectory(int64_t process, bool fresh, int *directory);
