// The table of nodes for readers and writers of the text form.
#pragma once

#include <stdio.h>

// Prints every node, what it offers, and the named fields of its records.
void PrintNodes(FILE *stream);
