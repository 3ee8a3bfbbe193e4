// Standard output, the one place for it: large blocks into a pipe or file, lines on a terminal,
// checked when the tool is done.
#pragma once

#include <stdio.h>

#include "base/shown.h"

// To be called once, before anything is printed.
void OpenOutput();

// Standard error, for a message: what was printed before it is written out first, so that a message
// stands where it belongs when both streams go to one place. Leaves errno alone.
FILE *Messages();

// Writes out what is still buffered. A failed write gives a message on standard error and 1 in the
// place of a `status` of 0; otherwise the result is `status`.
int CloseOutput(int status);
