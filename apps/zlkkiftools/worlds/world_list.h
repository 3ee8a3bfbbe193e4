// The engine of ps.
#pragma once

#include "worlds/ps_options.h"

// Reads the worlds or cartels of the host and prints the listing that `options` ask for. False,
// after a message on standard error and with nothing on standard output, where it could not.
bool WorldList(PsOptions options);
