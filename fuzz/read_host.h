// Asks the present host for everything that it lists, through the operations that tools have.
#pragma once

// Only what belongs to the nodes whose path begins with one of `prefixes` (ended by null; null
// itself: every node) is asked for.
void ReadHost(const char *const *prefixes);
