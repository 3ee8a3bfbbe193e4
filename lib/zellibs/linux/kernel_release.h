// The release of the host's kernel.
#pragma once

#include <cstddef>

#include "zellibs.h"

// Writes the release ("6.1.0-9-amd64"), printable and terminated, to `release`.
KIF_Status ReadKernelRelease(char *release, size_t size);
